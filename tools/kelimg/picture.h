// Grey pictures in memory and on disk for kelimg.
#ifndef KELIMG_PICTURE_H
#define KELIMG_PICTURE_H

#include <cstdint>
#include <stdexcept>
#include <string>
#include <vector>

namespace kelimg {

// Something wrong with what the user gave or asked for: a file, an option, a size. The tool
// prints the message as one line and exits with status 2.
class InputError : public std::runtime_error {
 public:
  using std::runtime_error::runtime_error;
};

// A plain raster, as the library's routines take it: height rows of width bytes, no padding.
struct Picture {
  int32_t width = 0;
  int32_t height = 0;
  std::vector<uint8_t> pixels;

  Picture() = default;
  Picture(int32_t picture_width, int32_t picture_height, uint8_t value);

  uint8_t *data() { return pixels.data(); }
  const uint8_t *data() const { return pixels.data(); }
  uint8_t at(int32_t x, int32_t y) const {
    return pixels[static_cast<size_t>(y) * static_cast<size_t>(width) + static_cast<size_t>(x)];
  }
  int64_t pixel_count() const { return int64_t{width} * height; }
};

// What the tool reads (whatever stb_image decodes) and writes, for --help and messages.
constexpr const char *kFormatsIn = "PNG, JPEG, BMP, PGM/PPM, GIF, TGA, PSD, HDR and PIC";
constexpr const char *kFormatsOut =
    "PNG (.png, and - or a name without an extension), PGM (.pgm), BMP (.bmp), JPEG (.jpg, .jpeg; "
    "quality 95), chosen by the output's extension";
constexpr int kJpegQuality = 95;

// Reads any format in kFormatsIn as 8-bit grey; "-" reads standard input. Colour is turned grey
// and 16-bit samples lose their low byte, with a one-line note on stderr.
Picture load_picture(const std::string &path);

enum class Format { png, pgm, bmp, jpeg };

// The format an output's extension names (see kFormatsOut); any other extension is an
// InputError, so that a name never promises one format and holds another.
Format output_format(const std::string &path);

// An output whose bytes are ready but not yet in place. A regular file (or one not there yet)
// is written to a temporary file beside it, which commit() renames over it: a failure before
// then leaves the target as it was. "-" is standard output, and devices, pipes and other
// special files are written in place at commit(), never replaced. Symbolic links are followed.
class PendingOutput {
 public:
  PendingOutput(const std::string &path, std::vector<uint8_t> bytes);
  PendingOutput(PendingOutput &&other) noexcept;
  PendingOutput &operator=(PendingOutput &&) = delete;
  ~PendingOutput();  // removes the temporary file unless committed

  void commit();

 private:
  [[noreturn]] void fail(int failure);

  std::string path_;            // as the user gave it, for messages
  std::string target_;          // with symbolic links followed
  std::string temporary_;       // the staged file, while there is one
  std::vector<uint8_t> bytes_;  // for special files, until commit
};

// Encodes the picture in the format its name asks for and stages it.
PendingOutput stage_picture(const std::string &path, const Picture &picture);

void save_picture(const std::string &path, const Picture &picture);

// Writes text (the gallery's index.html) the same way.
void save_text(const std::string &path, const std::string &text);

}  // namespace kelimg

#endif  // KELIMG_PICTURE_H
