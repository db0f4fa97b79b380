// Our default fixed-point cosine, sine and square root.
#include "kel_outside.h"

namespace {

// 16384 * cos(i * 2pi / 256) rounded to nearest, for the first quarter turn i = 0 .. 64. The
// other three quarters follow by symmetry, which keeps the quarter turns exact and makes
// cos(-a) == cos(a) and sin(-a) == -sin(a) hold to the bit, as the rotations' inverse needs.
constexpr int16_t kQuarterCosine[65] = {
    16384, 16379, 16364, 16340, 16305, 16261, 16207, 16143, 16069, 15986, 15893, 15791, 15679,
    15557, 15426, 15286, 15137, 14978, 14811, 14635, 14449, 14256, 14053, 13842, 13623, 13395,
    13160, 12916, 12665, 12406, 12140, 11866, 11585, 11297, 11003, 10702, 10394, 10080, 9760,
    9434,  9102,  8765,  8423,  8076,  7723,  7366,  7005,  6639,  6270,  5897,  5520,  5139,
    4756,  4370,  3981,  3590,  3196,  2801,  2404,  2006,  1606,  1205,  804,   402,   0};

// Integer square root, rounded down, digit by digit: exact for every 32-bit input.
uint32_t isqrt(uint32_t x) {
  uint32_t root = 0;
  uint32_t bit = uint32_t{1} << 30;
  while (bit > x) bit >>= 2;
  while (bit != 0) {
    if (x >= root + bit) {
      x -= root + bit;
      root = (root >> 1) + bit;
    } else {
      root >>= 1;
    }
    bit >>= 2;
  }
  return root;
}

}  // namespace

extern "C" {

int32_t tq_cos_(uint8_t angle) {
  const unsigned quadrant = angle >> 6;
  const unsigned step = angle & 63u;
  switch (quadrant) {
    case 0:
      return kQuarterCosine[step];
    case 1:
      return -kQuarterCosine[64 - step];
    case 2:
      return -kQuarterCosine[step];
    default:
      return kQuarterCosine[64 - step];
  }
}

// sin(a) = cos(a - quarter turn); positive for angles 1 .. 127.
int32_t tq_sin_(uint8_t angle) {
  return tq_cos_(static_cast<uint8_t>(angle - 64u));
}

// sqrt(x / 2^24) with 5 fraction bits is sqrt(x) / 128; flooring the integer root first gives
// the same floor, so the result is exact.
uint32_t tq_sqrt_24_5(uint32_t x) {
  return isqrt(x) >> 7;
}

}  // extern "C"
