// The kernel table of our blur and enlargement: every row loop of both as one operation with one
// plain body, in the same way as the library's own table.
//
// The plain body is the reference, the same function in every build, and it finishes whatever a
// variant leaves: a variant does whole vectors from the start of its row and returns how many
// pixels it did, and the plain body does the rest. The table comes from one place,
// filter_kernels(): Highway's run-time choice among the instruction sets it was built for where
// Highway runs, otherwise the plain bodies, known when compiling.
#ifndef KEL_OUTSIDE_IMAGE_FILTERS_SIMD_H_
#define KEL_OUTSIDE_IMAGE_FILTERS_SIMD_H_

#include <cstddef>
#include <cstdint>

namespace kel {
namespace outside {

// smooth(a, b, c) below is (a + 2b + c + 2) >> 2, one pass of the blur.
struct FilterKernels {
  // dst[i] = smooth(src[i], src[i + 1], src[i + 2]); dst does not overlap src.
  size_t (*smooth_triples)(const uint8_t *src, size_t count, uint8_t *dst);
  // lower[i] = smooth(row[i], row[i + 1], row[i + 2]), then
  // upper[i] = smooth(upper[i], centre[i], lower[i]); the four rows do not overlap.
  size_t (*smooth_across_and_down)(const uint8_t *row, size_t count, uint8_t *upper,
                                   const uint8_t *centre, uint8_t *lower);
  // row[i] = smooth(above[i], row[i], below[i]) and above[i] = the old row[i]; `below` may be
  // `row` itself.
  size_t (*smooth_down_carrying)(uint8_t *above, uint8_t *row, const uint8_t *below, size_t count);
  // pairs[i] = 16 * spread[i] + odd[i] * (spread[i + 8] - spread[i]), modulo 2^16.
  size_t (*blend_spread)(const uint8_t *spread, const uint8_t *odd, size_t count, uint16_t *pairs);
  // Output row j = 0 .. 7 (at out + j * stride) takes (16 * upper + 128 + (2j + 1) * (lower -
  // upper)) >> 8, modulo 2^16 before the shift.
  size_t (*mix_eight_rows)(const uint16_t *upper, const uint16_t *lower, size_t count, uint8_t *out,
                           size_t stride);
  // out[i] = (top[i] * (16 - w) + bottom[i] * w + 128) >> 8 with w = weight_bottom >> 4.
  size_t (*blend_rows_coarse)(const uint16_t *top, const uint16_t *bottom, uint32_t weight_bottom,
                              size_t count, uint8_t *out);
};

// The plain bodies: each does its whole row and returns count.
namespace plain {
size_t smooth_triples(const uint8_t *src, size_t count, uint8_t *dst);
size_t smooth_across_and_down(const uint8_t *row, size_t count, uint8_t *upper,
                              const uint8_t *centre, uint8_t *lower);
size_t smooth_down_carrying(uint8_t *above, uint8_t *row, const uint8_t *below, size_t count);
size_t blend_spread(const uint8_t *spread, const uint8_t *odd, size_t count, uint16_t *pairs);
size_t mix_eight_rows(const uint16_t *upper, const uint16_t *lower, size_t count, uint8_t *out,
                      size_t stride);
size_t blend_rows_coarse(const uint16_t *top, const uint16_t *bottom, uint32_t weight_bottom,
                         size_t count, uint8_t *out);
}  // namespace plain

// The plain bodies, as a table.
inline constexpr FilterKernels kPlainFilterKernels = {
    plain::smooth_triples, plain::smooth_across_and_down, plain::smooth_down_carrying,
    plain::blend_spread,   plain::mix_eight_rows,         plain::blend_rows_coarse};

#ifndef KEL_USE_HIGHWAY
#define KEL_USE_HIGHWAY 0
#endif

#if KEL_USE_HIGHWAY
// The table this machine runs: Highway's choice among the instruction sets it was built for.
const FilterKernels &filter_kernels();
#else
// The table this build runs, known when compiling: the blur and the enlargement then call their
// bodies directly, and a firmware that calls one of them carries only that one's bodies.
constexpr const FilterKernels &filter_kernels() {
  return kPlainFilterKernels;
}
#endif

}  // namespace outside
}  // namespace kel

#endif  // KEL_OUTSIDE_IMAGE_FILTERS_SIMD_H_
