// The statistics' pixel loops: the plain versions, which every target builds, and the vector
// variants, which are built with Highway and picked at run time for the machine. Each vector
// variant gives exactly the plain version's result.
#ifndef KEL_SIMD_STATISTICS_SIMD_H_
#define KEL_SIMD_STATISTICS_SIMD_H_

#include <cstddef>
#include <cstdint>

namespace kel {

// The sum of the pixel values and the sum of their squares, both wrapped modulo 2^32.
struct PixelSums {
  uint32_t sum;
  uint32_t sum_of_squares;
};

// The vector variants take up to this many bins; wider histograms stay with the plain count.
constexpr uint32_t kMostVectorBinBits = 4;

namespace plain {

// Clears hist[0 .. 2^bits) and counts the top `bits` bits (0 to 8) of pixels[0 .. count) into
// it; count is below 2^31.
void count_top_bits(const uint8_t *pixels, uint32_t count, uint32_t bits, uint32_t *hist);

PixelSums pixel_sums(const uint8_t *pixels, uint32_t count);

}  // namespace plain

namespace simd {

// As plain::count_top_bits, for bits up to kMostVectorBinBits.
void count_top_bits(const uint8_t *pixels, uint32_t count, uint32_t bits, uint32_t *hist);

PixelSums pixel_sums(const uint8_t *pixels, uint32_t count);

}  // namespace simd
}  // namespace kel

#endif  // KEL_SIMD_STATISTICS_SIMD_H_
