// Vector variants of the rotations' inner loop, picked at run time for the machine.
#ifndef KEL_SIMD_ROTATION_SIMD_H_
#define KEL_SIMD_ROTATION_SIMD_H_

#include <cstddef>
#include <cstdint>

namespace kel {
namespace simd {

// A run of `count` consecutive canvas pixels of one row. The first shows source position
// (x, y), in units of 1/16384 pixel, and each next one is (step_x, step_y) further. Every
// position of the run lies where the routine resamples (inside the source, with both bilinear
// neighbours for the bilinear ones); the source has fewer than 2^16 rows and columns, fewer than
// 2^31 pixels, and at least 4 pixels for the nearest-neighbour run.
struct RotationRow {
  const void *src;
  int32_t height, width;
  int32_t x, y, step_x, step_y;
  size_t count;
};

// Each writes the first pixels of the run to out[0], out[1], ..., exactly as the plain loop
// would, and returns how many it wrote: a multiple of the vector length, at most `count`. The
// caller finishes the rest.
size_t rotate_row_bilinear(const RotationRow &row, uint8_t *out);
size_t rotate_row_bilinear(const RotationRow &row, int8_t *out);
size_t rotate_row_nearest(const RotationRow &row, int8_t *out);

}  // namespace simd
}  // namespace kel

#endif  // KEL_SIMD_ROTATION_SIMD_H_
