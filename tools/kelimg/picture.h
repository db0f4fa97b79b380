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

// Reads a PNG, JPEG, BMP, PGM (or anything else the decoder knows) as 8-bit grey. Colour is
// turned grey and 16-bit samples lose their low byte, with a one-line note on stderr.
Picture load_picture(const std::string &path);

// Writes an 8-bit grey PNG. The bytes go to a temporary file beside the target, which is
// renamed over it only when complete, so a failure never leaves a partly written picture.
void save_png(const std::string &path, const Picture &picture);

// Writes text (the gallery's index.html) with the same all-or-nothing rename.
void save_text(const std::string &path, const std::string &text);

}  // namespace kelimg

#endif  // KELIMG_PICTURE_H
