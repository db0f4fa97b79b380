#include "picture.h"

#include <fcntl.h>
#include <png.h>
#include <stb_image.h>
#include <stb_image_write.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cctype>
#include <cerrno>
#include <climits>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <memory>
#include <utility>

namespace kelimg {
namespace {

// How messages name a file; "-" is the standard stream it stands for.
std::string quoted(const std::string &path, const char *stream = "standard input") {
  return path == "-" ? stream : "'" + path + "'";
}
std::string output_name(const std::string &path) {
  return quoted(path, "standard output");
}

std::string system_reason() {
  return std::strerror(errno);
}

std::vector<uint8_t> read_file(const std::string &path) {
  std::error_code error;
  if (std::filesystem::is_directory(path, error)) {
    throw InputError("cannot read " + quoted(path) + ": it is a directory");
  }
  const auto finish = [](std::FILE *stream) { return stream == stdin ? 0 : std::fclose(stream); };
  std::unique_ptr<std::FILE, int (*)(std::FILE *)> file(
      path == "-" ? stdin : std::fopen(path.c_str(), "rb"), finish);
  if (!file) throw InputError("cannot open " + quoted(path) + ": " + system_reason());
  std::vector<uint8_t> bytes;
  uint8_t chunk[1 << 16];
  size_t got = 0;
  while ((got = std::fread(chunk, 1, sizeof chunk, file.get())) > 0) {
    // The decoder takes the length as an int.
    if (bytes.size() + got > static_cast<size_t>(INT_MAX)) {
      throw InputError(quoted(path) + " is too large to decode (2 GiB or more)");
    }
    bytes.insert(bytes.end(), chunk, chunk + got);
  }
  if (std::ferror(file.get())) {
    throw InputError("cannot read " + quoted(path) + ": " + system_reason());
  }
  return bytes;
}

struct StbFree {
  void operator()(void *pixels) const { stbi_image_free(pixels); }
};

// Binary Netpbm (P5 grey, P6 colour) is looked at before the decoder sees it: this version of
// stb reads 16-bit samples in the machine's byte order rather than the file's, and hands back
// uninitialised pixels for a file cut short. So a short file is refused here, and 16-bit samples
// are cut to their high byte here, leaving the decoder an 8-bit file. Returns whether samples
// were cut. A header that does not parse is left for the decoder to report.
bool prepare_netpbm(std::vector<uint8_t> &bytes, const std::string &path) {
  const size_t size = bytes.size();
  if (size < 2 || bytes[0] != 'P' || (bytes[1] != '5' && bytes[1] != '6')) return false;
  const auto is_space = [](uint8_t c) { return c == ' ' || (c >= '\t' && c <= '\r'); };
  const auto is_digit = [](uint8_t c) { return c >= '0' && c <= '9'; };
  size_t at = 2;
  uint64_t fields[3] = {};  // width, height, largest sample value
  for (uint64_t &field : fields) {
    while (at < size && (is_space(bytes[at]) || bytes[at] == '#')) {
      if (bytes[at] == '#') {
        while (at < size && bytes[at] != '\n') ++at;
      } else {
        ++at;
      }
    }
    if (at == size || !is_digit(bytes[at])) return false;
    for (; at < size && is_digit(bytes[at]); ++at) {
      field = std::min<uint64_t>(field * 10 + (bytes[at] - '0'), uint64_t{1} << 32);
    }
  }
  const uint64_t width = fields[0], height = fields[1], largest = fields[2];
  // Sides beyond the decoder's limit of 2^24 are left for it to refuse.
  if (at == size || !is_space(bytes[at]) || width == 0 || height == 0 || largest == 0 ||
      largest > 65535 || width > (1 << 24) || height > (1 << 24)) {
    return false;
  }
  ++at;  // one whitespace byte ends the header
  const uint64_t sample_bytes = largest > 255 ? 2 : 1;
  const uint64_t samples = width * height * (bytes[1] == '6' ? 3 : 1);
  if (size - at < samples * sample_bytes) {
    throw InputError("cannot decode " + quoted(path) + ": the file is cut short (truncated)");
  }
  if (sample_bytes == 1) return false;
  const std::string header = std::string("P") + static_cast<char>(bytes[1]) + "\n" +
                             std::to_string(width) + " " + std::to_string(height) + "\n255\n";
  std::vector<uint8_t> reduced(header.begin(), header.end());
  reduced.reserve(header.size() + samples);
  // Netpbm stores the high byte first.
  for (uint64_t i = 0; i < samples; ++i) reduced.push_back(bytes[at + 2 * i]);
  bytes.swap(reduced);
  return true;
}

// Decodes to one channel; the decoder does the grey conversion itself. Samples of 16 bits keep
// their high byte.
template <typename Sample>
Picture decode(const std::vector<uint8_t> &bytes, const std::string &path, bool cut_to_8_bits) {
  const auto length = static_cast<int>(bytes.size());
  int width = 0, height = 0, channels = 0;
  std::unique_ptr<Sample, StbFree> samples;
  if constexpr (sizeof(Sample) == 2) {
    samples.reset(stbi_load_16_from_memory(bytes.data(), length, &width, &height, &channels, 1));
  } else {
    samples.reset(stbi_load_from_memory(bytes.data(), length, &width, &height, &channels, 1));
  }
  if (!samples) {
    const char *reason = stbi_failure_reason();
    throw InputError("cannot decode " + quoted(path) + ": " +
                     (reason != nullptr ? reason : "unknown format") +
                     " (corrupt, truncated or not a picture)");
  }
  Picture picture;
  picture.width = width;
  picture.height = height;
  picture.pixels.resize(static_cast<size_t>(picture.pixel_count()));
  for (size_t i = 0; i < picture.pixels.size(); ++i) {
    picture.pixels[i] = static_cast<uint8_t>(samples.get()[i] >> (8 * (sizeof(Sample) - 1)));
  }

  std::vector<std::string> changes;
  if (channels >= 3) changes.push_back("colour converted to grey");
  if (channels == 2 || channels == 4) changes.push_back("alpha dropped");
  if (sizeof(Sample) == 2 || cut_to_8_bits) changes.push_back("16-bit samples reduced to 8 bits");
  if (!changes.empty()) {
    std::string note = changes[0];
    for (size_t i = 1; i < changes.size(); ++i) note += ", " + changes[i];
    std::fprintf(stderr, "kelimg: note: %s: %s\n", quoted(path).c_str(), note.c_str());
  }
  return picture;
}

// Writes every byte, resuming after interruptions and short writes; returns 0 or the errno.
int write_all(int fd, const uint8_t *bytes, size_t size) {
  while (size > 0) {
    const ssize_t got = write(fd, bytes, size);
    if (got < 0 && errno == EINTR) continue;
    if (got <= 0) return got < 0 ? errno : EIO;
    bytes += got;
    size -= static_cast<size_t>(got);
  }
  return 0;
}

// The file a name finally stands for: symbolic links are followed, so that writing through a
// link updates what it points to and leaves the link itself in place. Links under /proc (where
// /dev/stdout leads) stand for open descriptors rather than paths, so a chain through one gives
// an empty path: such an output is written in place, like the stream it is.
std::filesystem::path resolve_links(const std::string &path) {
  std::filesystem::path target(path);
  std::error_code error;
  for (int hops = 0; std::filesystem::is_symlink(target, error); ++hops) {
    if (hops == 40) throw InputError("cannot write " + quoted(path) + ": " + std::strerror(ELOOP));
    if (target.string().rfind("/proc/", 0) == 0) return {};
    const std::filesystem::path next = std::filesystem::read_symlink(target, error);
    if (error) throw InputError("cannot write " + quoted(path) + ": " + error.message());
    target = next.is_absolute() ? next : target.parent_path() / next;
  }
  return target;
}

struct Encoder {
  std::vector<uint8_t> bytes;
  static void append(void *context, void *data, int size) {
    const auto *first = static_cast<const uint8_t *>(data);
    static_cast<Encoder *>(context)->bytes.insert(static_cast<Encoder *>(context)->bytes.end(),
                                                  first, first + size);
  }
};

std::vector<uint8_t> encode_png(const std::string &path, const Picture &picture) {
  png_image image;
  std::memset(&image, 0, sizeof image);
  image.version = PNG_IMAGE_VERSION;
  image.width = static_cast<png_uint_32>(picture.width);
  image.height = static_cast<png_uint_32>(picture.height);
  image.format = PNG_FORMAT_GRAY;
  png_alloc_size_t size = 0;
  // The first call measures, the second encodes.
  bool encoded =
      png_image_write_to_memory(&image, nullptr, &size, 0, picture.data(), 0, nullptr) != 0;
  std::vector<uint8_t> encoding(encoded ? size : 0);
  encoded = encoded && png_image_write_to_memory(&image, encoding.data(), &size, 0, picture.data(),
                                                 0, nullptr) != 0;
  if (!encoded) {
    const std::string reason = image.message;
    png_image_free(&image);
    throw InputError("cannot encode " + output_name(path) + ": " + reason);
  }
  encoding.resize(size);
  return encoding;
}

std::vector<uint8_t> encode_pgm(const Picture &picture) {
  const std::string header =
      "P5\n" + std::to_string(picture.width) + " " + std::to_string(picture.height) + "\n255\n";
  std::vector<uint8_t> bytes(header.begin(), header.end());
  bytes.insert(bytes.end(), picture.pixels.begin(), picture.pixels.end());
  return bytes;
}

// BMP and JPEG come from stb_image_write, which counts bytes in int and writes JPEG sides in
// 16 bits; pictures beyond either are refused before it is called.
std::vector<uint8_t> encode_stb(const std::string &path, const Picture &picture, Format format) {
  const int64_t bmp_bytes = (int64_t{picture.width} * 3 + 3) * picture.height + 54;
  if ((format == Format::bmp && bmp_bytes > INT_MAX) ||
      (format == Format::jpeg && (picture.width > 65535 || picture.height > 65535))) {
    throw InputError("cannot encode " + output_name(path) + ": the picture is too large for " +
                     (format == Format::bmp ? "BMP" : "JPEG"));
  }
  Encoder encoder;
  const int written = format == Format::bmp
                          ? stbi_write_bmp_to_func(Encoder::append, &encoder, picture.width,
                                                   picture.height, 1, picture.data())
                          : stbi_write_jpg_to_func(Encoder::append, &encoder, picture.width,
                                                   picture.height, 1, picture.data(), kJpegQuality);
  if (written == 0) throw InputError("cannot encode " + output_name(path));
  return std::move(encoder.bytes);
}

std::string lower(std::string text) {
  for (char &c : text) c = static_cast<char>(std::tolower(static_cast<unsigned char>(c)));
  return text;
}
}  // namespace

Picture::Picture(int32_t picture_width, int32_t picture_height, uint8_t value)
    : width(picture_width),
      height(picture_height),
      pixels(static_cast<size_t>(int64_t{picture_width} * picture_height), value) {}

Picture load_picture(const std::string &path) {
  std::vector<uint8_t> bytes = read_file(path);
  if (bytes.empty()) throw InputError("cannot decode " + quoted(path) + ": the file is empty");
  const bool cut_to_8_bits = prepare_netpbm(bytes, path);
  const auto length = static_cast<int>(bytes.size());
  if (stbi_is_16_bit_from_memory(bytes.data(), length)) {
    return decode<uint16_t>(bytes, path, cut_to_8_bits);
  }
  return decode<uint8_t>(bytes, path, cut_to_8_bits);
}

Format output_format(const std::string &path) {
  const std::string extension = lower(std::filesystem::path(path).extension().string());
  if (path == "-" || extension.empty() || extension == ".png") return Format::png;
  if (extension == ".pgm") return Format::pgm;
  if (extension == ".bmp") return Format::bmp;
  if (extension == ".jpg" || extension == ".jpeg") return Format::jpeg;
  throw InputError("cannot write " + output_name(path) + ": no format is written for '" +
                   extension + "'; the formats out are " + kFormatsOut);
}

PendingOutput::PendingOutput(const std::string &path, std::vector<uint8_t> bytes)
    : path_(path), bytes_(std::move(bytes)) {
  if (path == "-") return;  // written at commit, like any stream
  struct stat status;
  const bool special = stat(path.c_str(), &status) == 0 && !S_ISREG(status.st_mode);
  if (special && S_ISDIR(status.st_mode)) {
    throw InputError("cannot write " + output_name(path) + ": it is a directory");
  }
  target_ = special ? std::string() : resolve_links(path).string();
  if (target_.empty()) {
    target_ = path;  // a device, pipe or socket: written in place at commit, never replaced
    return;
  }
  const std::filesystem::path target(target_);
  const std::filesystem::path directory =
      target.has_parent_path() ? target.parent_path() : std::filesystem::path(".");
  temporary_ = (directory / ("." + target.filename().string() + ".XXXXXX")).string();
  const int fd = mkstemp(temporary_.data());
  if (fd < 0) {
    temporary_.clear();
    throw InputError("cannot write " + output_name(path) + ": " + system_reason());
  }
  // mkstemp makes the file private; give it the permissions an ordinary new file gets.
  const mode_t mask = umask(0);
  umask(mask);
  int failure = fchmod(fd, 0666 & ~mask) == 0 ? 0 : errno;
  if (failure == 0) failure = write_all(fd, bytes_.data(), bytes_.size());
  if (close(fd) != 0 && failure == 0) failure = errno;
  bytes_.clear();
  if (failure != 0) fail(failure);
}

PendingOutput::PendingOutput(PendingOutput &&other) noexcept
    : path_(std::move(other.path_)),
      target_(std::move(other.target_)),
      temporary_(std::exchange(other.temporary_, std::string())),
      bytes_(std::move(other.bytes_)) {}

PendingOutput::~PendingOutput() {
  if (!temporary_.empty()) std::remove(temporary_.c_str());
}

void PendingOutput::fail(int failure) {
  if (!temporary_.empty()) std::remove(temporary_.c_str());
  temporary_.clear();
  throw InputError("cannot write " + output_name(path_) + ": " + std::strerror(failure));
}

void PendingOutput::commit() {
  if (!temporary_.empty()) {
    if (std::rename(temporary_.c_str(), target_.c_str()) != 0) fail(errno);
    temporary_.clear();
    return;
  }
  // Appending continues a file reached through /dev/stdout where the descriptor has got to,
  // rather than at its start; to devices and pipes it makes no difference.
  const int fd =
      path_ == "-" ? STDOUT_FILENO : open(target_.c_str(), O_WRONLY | O_APPEND | O_CLOEXEC);
  if (fd < 0) fail(errno);
  int failure = write_all(fd, bytes_.data(), bytes_.size());
  if (fd != STDOUT_FILENO && close(fd) != 0 && failure == 0) failure = errno;
  if (failure != 0) fail(failure);
}

PendingOutput stage_picture(const std::string &path, const Picture &picture) {
  const Format format = output_format(path);
  switch (format) {
    case Format::png:
      return PendingOutput(path, encode_png(path, picture));
    case Format::pgm:
      return PendingOutput(path, encode_pgm(picture));
    default:
      return PendingOutput(path, encode_stb(path, picture, format));
  }
}

void save_picture(const std::string &path, const Picture &picture) {
  stage_picture(path, picture).commit();
}

void save_text(const std::string &path, const std::string &text) {
  PendingOutput(path, std::vector<uint8_t>(text.begin(), text.end())).commit();
}
}  // namespace kelimg
