#include <gtest/gtest.h>

#include <cmath>
#include <cstdint>

#include "kel_outside.h"

namespace {

// The rotations' worked quarter turns (16384, 0, -16384, 0) follow from the rounding; the
// opposite angle must be the exact inverse, and the sine positive on the first half turn.
TEST(FixedMath, CosineAndSineAreRoundedAndTheOppositeAngleIsTheExactInverse) {
  const double pi = std::acos(-1.0);
  for (int a = 0; a < 256; ++a) {
    const uint8_t angle = static_cast<uint8_t>(a), opposite = static_cast<uint8_t>(-a & 255);
    const double radians = a * 2.0 * pi / 256.0;
    EXPECT_EQ(tq_cos_(angle), std::lround(16384.0 * std::cos(radians))) << a;
    EXPECT_EQ(tq_sin_(angle), std::lround(16384.0 * std::sin(radians))) << a;
    EXPECT_EQ(tq_cos_(opposite), tq_cos_(angle)) << a;
    EXPECT_EQ(tq_sin_(opposite), -tq_sin_(angle)) << a;
    EXPECT_EQ(tq_sin_(angle) > 0, a >= 1 && a <= 127) << a;
  }
}

// v << 18 keeps all its bits up to v = 16383; no image variance exceeds 16256.
TEST(FixedMath, SquareRootGivesTheWholeRootOfEveryVarianceThatFitsTheShift) {
  for (uint32_t v = 0; v < 16384; ++v) {
    ASSERT_EQ(tq_sqrt_24_5(v << 18) >> 2, uint32_t(std::floor(std::sqrt(double(v))))) << v;
  }
}

// sqrt(x) / 128 rounded down: r is right when (128 r)^2 <= x < (128 (r + 1))^2.
TEST(FixedMath, SquareRootIsRoundedDownOverTheWholeRange) {
  for (uint64_t x = 0; x <= UINT32_MAX; x += 65521) {
    const uint64_t r = tq_sqrt_24_5(static_cast<uint32_t>(x));
    EXPECT_LE((128 * r) * (128 * r), x) << x;
    EXPECT_GT((128 * (r + 1)) * (128 * (r + 1)), x) << x;
  }
  EXPECT_EQ(tq_sqrt_24_5(UINT32_MAX), 511u);
  EXPECT_EQ(tq_sqrt_24_5(16384), 1u);
  EXPECT_EQ(tq_sqrt_24_5(16383), 0u);
}

}  // namespace
