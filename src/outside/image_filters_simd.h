// The row loops of our default blur and enlargement: the plain versions, which every build has,
// and vector variants built with Highway and picked at run time for the machine. Each variant
// gives exactly the plain loop's result; the blur and the enlargement run on either set.
#ifndef KEL_OUTSIDE_IMAGE_FILTERS_SIMD_H_
#define KEL_OUTSIDE_IMAGE_FILTERS_SIMD_H_

#include <cstddef>
#include <cstdint>

namespace kel {
namespace outside {

// smooth(a, b, c) below is (a + 2b + c + 2) >> 2, one pass of the blur.
struct FilterLoops {
  // dst[i] = smooth(src[i], src[i + 1], src[i + 2]); dst does not overlap src.
  void (*smooth_triples)(const uint8_t *src, size_t count, uint8_t *dst);
  // lower[i] = smooth(row[i], row[i + 1], row[i + 2]), then
  // upper[i] = smooth(upper[i], centre[i], lower[i]); the four rows do not overlap.
  void (*smooth_across_and_down)(const uint8_t *row, size_t count, uint8_t *upper,
                                 const uint8_t *centre, uint8_t *lower);
  // row[i] = smooth(above[i], row[i], below[i]) and above[i] = the old row[i]; `below` may be
  // `row` itself.
  void (*smooth_down_carrying)(uint8_t *above, uint8_t *row, const uint8_t *below, size_t count);
  // pairs[i] = 16 * spread[i] + odd[i] * (spread[i + 8] - spread[i]), modulo 2^16.
  void (*blend_spread)(const uint8_t *spread, const uint8_t *odd, size_t count, uint16_t *pairs);
  // Output row j = 0 .. 7 (at out + j * stride) takes (16 * upper + 128 + (2j + 1) * (lower -
  // upper)) >> 8, modulo 2^16 before the shift.
  void (*mix_eight_rows)(const uint16_t *upper, const uint16_t *lower, size_t count, uint8_t *out,
                         size_t stride);
  // out[i] = (top[i] * (16 - w) + bottom[i] * w + 128) >> 8 with w = weight_bottom >> 4.
  void (*blend_rows_coarse)(const uint16_t *top, const uint16_t *bottom, uint32_t weight_bottom,
                            size_t count, uint8_t *out);
};

// The blur and the enlargement of kel_outside.h, running their rows on `loops`.
void blur(const FilterLoops &loops, const uint8_t *in, uint16_t height, uint16_t width,
          uint8_t *out);
void scale_up_bilinear(const FilterLoops &loops, const uint8_t *in, uint16_t in_height,
                       uint16_t in_width, uint16_t factor, uint8_t *out, uint16_t out_height,
                       uint16_t out_width);

namespace plain {

void smooth_triples(const uint8_t *src, size_t count, uint8_t *dst);
void smooth_across_and_down(const uint8_t *row, size_t count, uint8_t *upper, const uint8_t *centre,
                            uint8_t *lower);
void smooth_down_carrying(uint8_t *above, uint8_t *row, const uint8_t *below, size_t count);
void blend_spread(const uint8_t *spread, const uint8_t *odd, size_t count, uint16_t *pairs);
void mix_eight_rows(const uint16_t *upper, const uint16_t *lower, size_t count, uint8_t *out,
                    size_t stride);
void blend_rows_coarse(const uint16_t *top, const uint16_t *bottom, uint32_t weight_bottom,
                       size_t count, uint8_t *out);

inline FilterLoops filter_loops() {
  return {smooth_triples, smooth_across_and_down, smooth_down_carrying,
          blend_spread,   mix_eight_rows,         blend_rows_coarse};
}

}  // namespace plain

namespace simd {
#if KEL_USE_HIGHWAY
// The variants chosen for this machine.
FilterLoops filter_loops();
#else
// Without Highway the plain loops are the only ones.
using plain::filter_loops;
#endif
}  // namespace simd

}  // namespace outside
}  // namespace kel

#endif  // KEL_OUTSIDE_IMAGE_FILTERS_SIMD_H_
