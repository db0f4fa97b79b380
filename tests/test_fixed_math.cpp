#include <gtest/gtest.h>

#include <cmath>
#include <cstdint>

#include "kel_outside.h"

namespace {

TEST(FixedMath, CosineAndSineAreRoundedAndExactAtQuarterTurns) {
  const double pi = std::acos(-1.0);
  for (int a = 0; a < 256; ++a) {
    const uint8_t angle = static_cast<uint8_t>(a);
    const double radians = a * 2.0 * pi / 256.0;
    EXPECT_EQ(tq_cos_(angle), std::lround(16384.0 * std::cos(radians))) << a;
    EXPECT_EQ(tq_sin_(angle), std::lround(16384.0 * std::sin(radians))) << a;
  }
  const int32_t quarter_cos[] = {16384, 0, -16384, 0};
  const int32_t quarter_sin[] = {0, 16384, 0, -16384};
  for (int q = 0; q < 4; ++q) {
    EXPECT_EQ(tq_cos_(static_cast<uint8_t>(q * 64)), quarter_cos[q]);
    EXPECT_EQ(tq_sin_(static_cast<uint8_t>(q * 64)), quarter_sin[q]);
  }
  EXPECT_EQ(tq_cos_(16), 15137);
  EXPECT_EQ(tq_sin_(16), 6270);
  EXPECT_EQ(tq_cos_(32), 11585);
  EXPECT_EQ(tq_sin_(32), 11585);
}

TEST(FixedMath, OppositeAngleIsTheExactInverse) {
  for (int a = 0; a < 256; ++a) {
    const uint8_t angle = static_cast<uint8_t>(a);
    const uint8_t opposite = static_cast<uint8_t>(-a & 255);
    EXPECT_EQ(tq_cos_(opposite), tq_cos_(angle)) << a;
    EXPECT_EQ(tq_sin_(opposite), -tq_sin_(angle)) << a;
    if (a >= 1 && a <= 127) {
      EXPECT_GT(tq_sin_(angle), 0) << a;
    }
  }
}

// v << 18 keeps all its bits up to v = 16383; no image variance exceeds 16256.
TEST(FixedMath, SquareRootGivesTheWholeRootOfEveryVarianceThatFitsTheShift) {
  for (uint32_t v = 0; v < 16384; ++v) {
    const uint32_t expected = static_cast<uint32_t>(std::floor(std::sqrt(double(v))));
    ASSERT_EQ(tq_sqrt_24_5(v << 18) >> 2, expected) << v;
  }
}

TEST(FixedMath, SquareRootIsRoundedDownOverTheWholeRange) {
  // sqrt(x) / 128 rounded down: r is right when (128 r)^2 <= x < (128 (r + 1))^2.
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
