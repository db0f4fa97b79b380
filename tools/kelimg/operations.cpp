#include "operations.h"

#include <algorithm>
#include <cmath>
#include <cstdlib>
#include <memory>
#include <new>
#include <type_traits>

#include "figures.h"
#include "kel_images.h"

namespace kelimg {
namespace {

std::string size_text(const Picture &picture) {
  return std::to_string(picture.width) + " x " + std::to_string(picture.height);
}

void require_sides(const Picture &picture, int64_t limit, const char *what) {
  if (picture.width > limit || picture.height > limit) {
    throw InputError("the " + std::string(what) + " is " + size_text(picture) + " pixels; " +
                     "this routine takes sides up to " + std::to_string(limit));
  }
}

// Signed pixels are the unsigned ones moved down by 128, so mid-grey becomes 0.
int8_t to_signed(uint8_t value) {
  return static_cast<int8_t>(value - 128);
}
uint8_t to_unsigned(int8_t value) {
  return static_cast<uint8_t>(value + 128);
}

// Calls one of the three rotations, which differ only in their pixel type, into a canvas of the
// size that kel_rotation_canvas gives: an unsigned picture's canvas is the result itself, a signed
// one is turned back into unsigned values.
template <typename Pixel, typename Size, typename Rotation>
Rotated run_rotation(Rotation rotate_into, const Pixel *source, const Picture &picture,
                     uint8_t angle, uint8_t (*to_picture)(Pixel)) {
  kel_canvas canvas;
  const size_t bytes = kel_rotation_canvas(picture.height, picture.width, angle, &canvas);
  if (bytes == 0) throw std::bad_alloc();  // no canvas of that size can exist here
  Rotated rotated;
  rotated.offset_x = canvas.offset_x;
  rotated.offset_y = canvas.offset_y;
  rotated.canvas = Picture(canvas.width, canvas.height, 0);
  const auto height = static_cast<Size>(picture.height), width = static_cast<Size>(picture.width);
  if constexpr (std::is_same_v<Pixel, uint8_t>) {
    rotate_into(source, height, width, angle, &canvas, rotated.canvas.data(), bytes);
  } else {
    std::vector<Pixel> pixels(bytes);
    rotate_into(source, height, width, angle, &canvas, pixels.data(), bytes);
    std::transform(pixels.begin(), pixels.end(), rotated.canvas.pixels.begin(), to_picture);
  }
  return rotated;
}

uint8_t same(uint8_t value) {
  return value;
}

}  // namespace

Statistics statistics(const Picture &picture) {
  const int64_t count = picture.pixel_count();
  if (count < 1 || count >= (int64_t{1} << 31)) {
    throw InputError("the picture is " + size_text(picture) + " pixels; the statistics need " +
                     "at least one pixel and fewer than 2^31");
  }
  Statistics stats;
  stats.count = static_cast<uint32_t>(count);
  kel_image_histogram(picture.data(), picture.height, picture.width, stats.histogram.data());
  stats.mean = kel_hist_mean(stats.histogram.data(), stats.count);
  stats.variance = kel_hist_var(stats.histogram.data(), stats.mean, stats.count);
  stats.std_dev = kel_hist_std(stats.histogram.data(), stats.mean, stats.count);

  uint64_t sum = 0, squares = 0;
  for (int64_t value = 0; value < 256; ++value) {
    const uint64_t bin = stats.histogram[static_cast<size_t>(value)];
    sum += bin * static_cast<uint64_t>(value);
    const int64_t deviation = value - stats.mean;
    squares += bin * static_cast<uint64_t>(deviation * deviation);
  }
  stats.mean_wrapped = sum > UINT32_MAX;
  stats.variance_wrapped = squares > UINT32_MAX;
  return stats;
}

std::vector<uint32_t> reduced_histogram(const Picture &picture, uint32_t bits) {
  std::vector<uint32_t> histogram(size_t{1} << bits);
  kel_image_histogram_n(picture.data(), picture.height, picture.width, bits, histogram.data());
  return histogram;
}

Picture plot_histogram(const Statistics &stats) {
  constexpr int32_t kLeft = 16, kBarsTop = 24, kBarsHeight = 128, kAxis = kBarsTop + kBarsHeight;
  Picture plot(kLeft + 256 + kLeft, kAxis + 24, 255);
  const auto draw = [&plot](const Figure &figure) { draw_figure(plot, figure); };

  const uint32_t tallest = *std::max_element(stats.histogram.begin(), stats.histogram.end());
  for (int32_t value = 0; value < 256; ++value) {
    const uint64_t bin = stats.histogram[static_cast<size_t>(value)];
    if (bin == 0) continue;
    // Every value that occurs gets at least one pixel of bar.
    const auto bar = static_cast<int32_t>(
        std::max<uint64_t>(1, bin * kBarsHeight / std::max<uint32_t>(tallest, 1)));
    draw(line(kLeft + value, kAxis - 1, kLeft + value, kAxis - bar, 112));
  }
  draw(line(kLeft - 1, kAxis, kLeft + 256, kAxis, 0));
  for (const int32_t tick : {0, 64, 128, 192, 255}) {
    draw(line(kLeft + tick, kAxis + 1, kLeft + tick, kAxis + 3, 0));
    draw(centred_number(tick, kLeft + tick, kAxis + 7, 0));
  }

  const int32_t mean_x = kLeft + stats.mean;
  for (int32_t y = kBarsTop - 4; y < kAxis; y += 4) draw(line(mean_x, y, mean_x, y + 1, 0));
  const int32_t low = kLeft + std::max(0, stats.mean - stats.std_dev);
  const int32_t high = kLeft + std::min(255, stats.mean + stats.std_dev);
  draw(line(low, 15, high, 15, 0));
  draw(line(low, 13, low, 17, 0));
  draw(line(high, 13, high, 17, 0));
  draw(centred_number(stats.mean, mean_x, 3, 0));
  return plot;
}

Rotated rotate(const Picture &picture, uint8_t angle, Resampling resampling) {
  if (picture.width >= 16384 || picture.height >= 16384) {
    throw InputError("the picture is " + size_text(picture) + " pixels; rotations take sides " +
                     "below 16384");
  }
  if (resampling == Resampling::bilinear) {
    return run_rotation<uint8_t, uint32_t>(kel_image_rotate_into, picture.data(), picture, angle,
                                           same);
  }
  std::vector<int8_t> source(picture.pixels.size());
  std::transform(picture.pixels.begin(), picture.pixels.end(), source.begin(), to_signed);
  if (resampling == Resampling::bilinear_int8) {
    return run_rotation<int8_t, uint32_t>(kel_image_rotate_int8_into, source.data(), picture, angle,
                                          to_unsigned);
  }
  return run_rotation<int8_t, int32_t>(kel_image_rotate_int8_nn_into, source.data(), picture, angle,
                                       to_unsigned);
}

uint8_t degrees_to_angle(double degrees) {
  const long units = std::lround(degrees * 256.0 / 360.0);
  return static_cast<uint8_t>(((units % 256) + 256) % 256);
}

Picture brighten(const Picture &picture, uint32_t percent) {
  Picture result(picture.width, picture.height, 0);
  kel_image_brighten(picture.data(), static_cast<uint32_t>(picture.height),
                     static_cast<uint32_t>(picture.width), percent, result.data());
  return result;
}

Picture darken(const Picture &picture, uint32_t percent) {
  Picture result(picture.width, picture.height, 0);
  kel_image_darken(picture.data(), static_cast<uint32_t>(picture.height),
                   static_cast<uint32_t>(picture.width), percent, result.data());
  return result;
}

Picture mask(const Picture &picture, int32_t key, bool viewable) {
  Picture result(picture.width, picture.height, 0);
  kel_get_mask(picture.data(), static_cast<uint32_t>(picture.height),
               static_cast<uint32_t>(picture.width), key, result.data());
  if (viewable) {
    for (uint8_t &value : result.pixels) value = static_cast<uint8_t>(value * 255);
  }
  return result;
}

Picture fill(const Picture &picture, const Picture &hole_mask) {
  require_sides(picture, 65528, "picture");
  if (hole_mask.width != picture.width || hole_mask.height != picture.height) {
    throw InputError("the mask is " + size_text(hole_mask) + " pixels, the picture " +
                     size_text(picture) + "; they must be the same size");
  }
  const auto height = static_cast<uint16_t>(picture.height);
  const auto width = static_cast<uint16_t>(picture.width);
  // The scratch is taken here rather than by kel_mask_image, so that no memory for it is an error
  // to report (exit 2, nothing written) rather than a picture the library left unwritten.
  const size_t scratch_bytes = kel_mask_image_scratch_size(height, width);
  if (scratch_bytes == 0) throw std::bad_alloc();  // more than size_t holds
  const std::unique_ptr<uint8_t[]> scratch(new uint8_t[scratch_bytes]);
  Picture result(picture.width, picture.height, 0);
  kel_mask_image_into(picture.data(), height, width, hole_mask.data(), result.data(), scratch.get(),
                      scratch_bytes);
  return result;
}

Picture compose(const Picture &base, const Picture &overlay, int32_t x, int32_t y, uint16_t key,
                Compose how) {
  require_sides(overlay, 65535, "overlay");
  if (std::abs(x) > kCoordinateLimit || std::abs(y) > kCoordinateLimit) {
    throw InputError("the position is outside -" + std::to_string(kCoordinateLimit) + " to " +
                     std::to_string(kCoordinateLimit));
  }
  Picture result = base;
  const auto routine = how == Compose::paste ? kel_image_draw_image : kel_image_blend_image;
  routine(result.data(), result.height, result.width, overlay.data(),
          static_cast<uint16_t>(overlay.height), static_cast<uint16_t>(overlay.width), x, y, key);
  return result;
}

}  // namespace kelimg
