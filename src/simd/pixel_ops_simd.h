// The pixel operations' row loops: the plain versions, which every target builds, and the
// vector variants, which are built with Highway and picked at run time for the machine. Each
// vector variant gives exactly the plain version's result.
//
// The row loops read in[i] (and out[i]) for i = 0, 1, ... and write out[i] after reading them.
// The vector variants read a vector's worth ahead, which gives the same result unless `out`
// starts strictly inside the input row; callers take the plain version then.
#ifndef KEL_SIMD_PIXEL_OPS_SIMD_H_
#define KEL_SIMD_PIXEL_OPS_SIMD_H_

#include <cstddef>
#include <cstdint>

namespace kel {

using RowLoop = void (*)(const uint8_t *in, size_t count, uint8_t *out);
using KeyedRowLoop = void (*)(const uint8_t *in, size_t count, uint8_t key, uint8_t *out);

// The row loops of paste and blend, looked up once for a call that runs many rows.
struct CompositeRowLoops {
  RowLoop copy, blend;
  KeyedRowLoop paste_with_key, blend_with_key;
};

namespace plain {

// out[i] = in[i] + floor(percent * (255 - in[i]) / 100), percent at most 100.
void brighten_row(const uint8_t *in, size_t count, uint16_t percent, uint8_t *out);
// out[i] = in[i] - floor(percent * in[i] / 100), percent at most 100.
void darken_row(const uint8_t *in, size_t count, uint16_t percent, uint8_t *out);
// out[i] = in[i]; the plain version is memmove, so it too needs `out` not to start inside `in`.
void copy_row(const uint8_t *in, size_t count, uint8_t *out);
// out[i] = (out[i] + in[i]) >> 1.
void blend_row(const uint8_t *in, size_t count, uint8_t *out);
// Where in[i] differs from key: out[i] = in[i] (paste) or (out[i] + in[i]) >> 1 (blend).
void paste_row_with_key(const uint8_t *in, size_t count, uint8_t key, uint8_t *out);
void blend_row_with_key(const uint8_t *in, size_t count, uint8_t key, uint8_t *out);
// out[i] = 0 where in[i] equals key, else 1.
void mask_row(const uint8_t *in, size_t count, uint8_t key, uint8_t *out);

// One past the last zero byte of bytes[0 .. count), or 0 when there is none.
size_t end_of_last_zero(const uint8_t *bytes, size_t count);

inline CompositeRowLoops composite_row_loops() {
  return {copy_row, blend_row, paste_row_with_key, blend_row_with_key};
}

}  // namespace plain

namespace simd {

#if KEL_USE_HIGHWAY
void brighten_row(const uint8_t *in, size_t count, uint16_t percent, uint8_t *out);
void darken_row(const uint8_t *in, size_t count, uint16_t percent, uint8_t *out);
void mask_row(const uint8_t *in, size_t count, uint8_t key, uint8_t *out);
size_t end_of_last_zero(const uint8_t *bytes, size_t count);
// The variants chosen for this machine, taken once per paste or blend.
CompositeRowLoops composite_row_loops();
#else
// Without Highway there are no vector variants: their names stand for the plain loops.
using plain::brighten_row;
using plain::composite_row_loops;
using plain::darken_row;
using plain::end_of_last_zero;
using plain::mask_row;
#endif

}  // namespace simd
}  // namespace kel

#endif  // KEL_SIMD_PIXEL_OPS_SIMD_H_
