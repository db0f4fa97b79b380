// Histograms, and the mean, variance and standard deviation of pixel intensities.
//
// Every sum is unsigned 32-bit and wraps modulo 2^32 on purpose, every division truncates, and
// the variance is taken about the truncated mean: callers compare these figures bit for bit.
#include <cstdint>
#include <cstring>

#include "kel_images.h"
#include "outside/kel_outside.h"
#include "simd/statistics_simd.h"

namespace kel {
namespace plain {

#if KEL_USE_HIGHWAY
// A run of one value would make every increment wait for the store of the one before, so
// consecutive pixels go to four histograms in turn -- the caller's and three on the stack (3 KiB
// at most) -- that are summed at the end. Eight pixels are read as one word, so the stores to
// the histograms never have to be checked against the next pixels' loads; which byte of the
// word goes to which histogram does not change the sums. Written out by hand, as compilers do
// not unroll the lanes at -O2.
void count_top_bits(const uint8_t *pixels, uint32_t count, uint32_t bits, uint32_t *hist) {
  const uint32_t shift = 8 - bits;
  const uint32_t bins = uint32_t{1} << bits;
  uint32_t lane1[256], lane2[256], lane3[256];
  for (uint32_t bin = 0; bin < bins; ++bin) hist[bin] = lane1[bin] = lane2[bin] = lane3[bin] = 0;

  const auto bin_of = [shift](uint64_t word, unsigned byte) {
    return static_cast<uint32_t>((word >> (8 * byte)) & 0xFF) >> shift;
  };
  uint32_t i = 0;
  for (; count - i >= 8; i += 8) {
    uint64_t word;
    std::memcpy(&word, pixels + i, sizeof word);
    ++hist[bin_of(word, 0)];
    ++lane1[bin_of(word, 1)];
    ++lane2[bin_of(word, 2)];
    ++lane3[bin_of(word, 3)];
    ++hist[bin_of(word, 4)];
    ++lane1[bin_of(word, 5)];
    ++lane2[bin_of(word, 6)];
    ++lane3[bin_of(word, 7)];
  }
  for (; i < count; ++i) ++hist[pixels[i] >> shift];

  // No bin can overflow: count is below 2^31.
  for (uint32_t bin = 0; bin < bins; ++bin) hist[bin] += lane1[bin] + lane2[bin] + lane3[bin];
}
#else
// Without the vector variants, as on microcontrollers whose whole stack may be a few KiB, the
// three extra histograms above would be the largest stack of the library: one count per pixel,
// straight into the caller's bins.
void count_top_bits(const uint8_t *pixels, uint32_t count, uint32_t bits, uint32_t *hist) {
  const uint32_t shift = 8 - bits;
  std::memset(hist, 0, sizeof *hist << bits);
  for (uint32_t i = 0; i < count; ++i) ++hist[pixels[i] >> shift];
}
#endif

PixelSums pixel_sums(const uint8_t *pixels, uint32_t count) {
  PixelSums sums{0, 0};
  for (uint32_t i = 0; i < count; ++i) {
    const uint32_t value = pixels[i];
    sums.sum += value;
    sums.sum_of_squares += value * value;
  }
  return sums;
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

// Counts with the vector variant where there is one for this many bins.
void count_pixels(const uint8_t *src, uint32_t n, uint32_t bits, uint32_t *hist) {
#if KEL_USE_HIGHWAY
  if (bits <= kel::kMostVectorBinBits) {
    kel::simd::count_top_bits(src, n, bits, hist);
    return;
  }
#endif
  kel::plain::count_top_bits(src, n, bits, hist);
}

kel::PixelSums sum_pixels(const uint8_t *src, uint32_t n) {
#if KEL_USE_HIGHWAY
  return kel::simd::pixel_sums(src, n);
#else
  return kel::plain::pixel_sums(src, n);
#endif
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
