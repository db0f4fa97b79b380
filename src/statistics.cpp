// Histograms, and the mean, variance and standard deviation of pixel intensities.
//
// Every sum is unsigned 32-bit and wraps modulo 2^32 on purpose, every division truncates, and
// the variance is taken about the truncated mean: callers compare these figures bit for bit.
#include <cstdint>
#include <cstring>

#include "kel_images.h"
#include "kernels.h"
#include "outside/kel_outside.h"

namespace kel {
namespace plain {

size_t count_bins(const uint8_t *pixels, size_t count, uint32_t bits, uint32_t *hist) {
  const uint32_t shift = 8 - bits;
  for (size_t i = 0; i < count; ++i) ++hist[pixels[i] >> shift];
  return count;
}

size_t sum_pixels(const uint8_t *pixels, size_t count, PixelSums *sums) {
  uint32_t sum = sums->sum, sum_of_squares = sums->sum_of_squares;
  for (size_t i = 0; i < count; ++i) {
    const uint32_t value = pixels[i];
    sum += value;
    sum_of_squares += value * value;
  }
  *sums = PixelSums{sum, sum_of_squares};
  return count;
}

}  // namespace plain
}  // namespace kel

namespace {

constexpr uint32_t kFullBits = 8;
constexpr uint32_t kFullBins = uint32_t{1} << kFullBits;

// height * width as the image's 32-bit arithmetic forms it. Multiplying in unsigned gives the
// same bits as the two's-complement product without ever being signed overflow.
uint32_t image_area(int32_t height, int32_t width) {
  return static_cast<uint32_t>(height) * static_cast<uint32_t>(width);
}

// The pixels a histogram visits: the area when it is positive read as a signed 32-bit value,
// otherwise none (an empty image, or sizes whose product is negative).
uint32_t pixels_to_visit(uint32_t area) {
  return area <= uint32_t{INT32_MAX} ? area : 0;
}

// Clears hist[0 .. 2^bits) and counts the top `bits` bits of n pixels into it.
void count_pixels(const uint8_t *src, uint32_t n, uint32_t bits, uint32_t *hist) {
  std::memset(hist, 0, sizeof *hist << bits);
  const size_t done = kel::kernels().count_bins(src, n, bits, hist);
  kel::kPlainKernels.count_bins(src + done, n - done, bits, hist);
}

kel::PixelSums sum_pixels(const uint8_t *src, uint32_t n) {
  kel::PixelSums sums{0, 0};
  const size_t done = kel::kernels().sum_pixels(src, n, &sums);
  kel::kPlainKernels.sum_pixels(src + done, n - done, &sums);
  return sums;
}

// floor(sqrt(variance)). tq_sqrt_24_5 reads v << 18 as v / 64 and returns its root with five
// fraction bits, 4 * sqrt(v). The shift is unsigned: v >= 16384 loses its top bits, which no
// variance of a correctly counted histogram reaches (16256 is the largest).
uint8_t std_from_var(uint16_t variance) {
  const uint32_t root = tq_sqrt_24_5(uint32_t{variance} << 18);
  return static_cast<uint8_t>((root >> 2) & 255u);
}

}  // namespace

extern "C" {

void kel_image_histogram(const uint8_t *src, int32_t height, int32_t width, uint32_t *hist) {
  count_pixels(src, pixels_to_visit(image_area(height, width)), kFullBits, hist);
}

void kel_image_histogram_n(const uint8_t *src, int32_t height, int32_t width, uint32_t bits,
                           uint32_t *hist) {
  // More than 8 bits would ask for bins no pixel reaches and a negative shift.
  const uint32_t used_bits = bits < kFullBits ? bits : kFullBits;
  count_pixels(src, pixels_to_visit(image_area(height, width)), used_bits, hist);
}

uint8_t kel_hist_mean(const uint32_t *hist, uint32_t count) {
  if (count == 0) return 0;
  uint32_t sum = 0;
  for (uint32_t value = 0; value < kFullBins; ++value) sum += value * hist[value];
  return static_cast<uint8_t>(sum / count);  // the low 8 bits of the quotient
}

uint16_t kel_hist_var(const uint32_t *hist, uint8_t mean, uint32_t count) {
  if (count == 0) return 0;
  const uint32_t centre = mean;
  uint32_t sum = 0;
  for (uint32_t value = 0; value < kFullBins; ++value) {
    const uint32_t deviation = value >= centre ? value - centre : centre - value;
    sum += hist[value] * (deviation * deviation);
  }
  return static_cast<uint16_t>(sum / count);  // the low 16 bits of the quotient
}

uint8_t kel_hist_std(const uint32_t *hist, uint8_t mean, uint32_t count) {
  return std_from_var(kel_hist_var(hist, mean, count));
}

// The histogram's statistics, taken straight from the pixels in one pass. With S = sum of p
// and Q = sum of p^2 (both modulo 2^32, as the histogram's sums wrap), the mean is S / count and
// the variance sum is sum of (p - m)^2 = Q - 2mS + n m^2 over the n pixels counted: an identity
// of integers, so it holds modulo 2^32 as well, wrapped products included.
uint16_t kel_image_var(const uint8_t *src, int32_t height, int32_t width, uint8_t *mean_out) {
  const uint32_t count = image_area(height, width);
  const uint32_t visited = pixels_to_visit(count);
  const kel::PixelSums sums = sum_pixels(src, visited);
  const auto mean = static_cast<uint8_t>(count != 0 ? sums.sum / count : 0);
  if (mean_out != nullptr) *mean_out = mean;
  if (count == 0) return 0;
  const uint32_t m = mean;
  const uint32_t deviations = sums.sum_of_squares - 2 * m * sums.sum + visited * (m * m);
  return static_cast<uint16_t>(deviations / count);
}

uint8_t kel_image_std(const uint8_t *src, int32_t height, int32_t width, uint8_t *mean_out) {
  return std_from_var(kel_image_var(src, height, width, mean_out));
}

}  // extern "C"
