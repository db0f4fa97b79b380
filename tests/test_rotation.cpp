#include <gtest/gtest.h>

#include <algorithm>
#include <cstdint>
#include <cstdlib>
#include <random>
#include <tuple>
#include <utility>
#include <vector>

#include "kel_images.h"
#include "kel_outside.h"
#include "test_support.h"

// The "cannot allocate" test asks malloc for 2^62 bytes; under AddressSanitizer that must come
// back as null, as it does from the C library, instead of aborting.
#if defined(__has_feature)
#if __has_feature(address_sanitizer)
#define KEL_TEST_ADDRESS_SANITIZER 1
#endif
#endif
#if defined(__SANITIZE_ADDRESS__) || defined(KEL_TEST_ADDRESS_SANITIZER)
extern "C" const char *__asan_default_options() {
  return "allocator_may_return_null=1";
}
#endif

namespace {

enum class Kind { kUnsigned, kSigned, kNearest };
const Kind kKinds[] = {Kind::kUnsigned, Kind::kSigned, Kind::kNearest};
const Kind kBilinearKinds[] = {Kind::kUnsigned, Kind::kSigned};

int fill_of(Kind kind) {
  return kind == Kind::kUnsigned ? 255 : (kind == Kind::kSigned ? 0 : -128);
}

// A canvas read back into ints (signed kinds as signed bytes); the sentinel -1 sizes show
// whether the routine wrote them.
struct Canvas {
  bool made = false;
  int32_t height = -1, width = -1, offset_y = -1, offset_x = -1;
  std::vector<int> pixels;
};

bool operator==(const Canvas &a, const Canvas &b) {
  return std::tie(a.made, a.height, a.width, a.offset_y, a.offset_x, a.pixels) ==
         std::tie(b.made, b.height, b.width, b.offset_y, b.offset_x, b.pixels);
}

// Runs one of the three routines; an empty `values` passes a null source.
Canvas run(Kind kind, const std::vector<int> &values, int64_t height, int64_t width,
           uint8_t angle) {
  std::vector<uint8_t> bytes;
  for (int v : values) bytes.push_back(static_cast<uint8_t>(v & 255));
  const uint8_t *src = bytes.empty() ? nullptr : bytes.data();
  const int8_t *signed_src = reinterpret_cast<const int8_t *>(src);
  Canvas out;
  uint8_t *block = reinterpret_cast<uint8_t *>(&out);  // must be overwritten
  int8_t *signed_block = reinterpret_cast<int8_t *>(&out);
  const uint32_t h = static_cast<uint32_t>(height), w = static_cast<uint32_t>(width);
  if (kind == Kind::kUnsigned) {
    kel_image_rotate(src, h, w, angle, &block, &out.height, &out.width, &out.offset_y,
                     &out.offset_x);
  } else if (kind == Kind::kSigned) {
    kel_image_rotate_int8(signed_src, h, w, angle, &signed_block, &out.height, &out.width,
                          &out.offset_y, &out.offset_x);
  } else {
    kel_image_rotate_int8_nn(signed_src, static_cast<int32_t>(h), static_cast<int32_t>(w), angle,
                             &signed_block, &out.height, &out.width, &out.offset_y, &out.offset_x);
  }
  if (kind != Kind::kUnsigned) block = reinterpret_cast<uint8_t *>(signed_block);
  out.made = block != nullptr;
  if (!out.made) return out;
  for (int64_t i = 0; i < int64_t{out.height} * out.width; ++i) {
    out.pixels.push_back(kind == Kind::kUnsigned ? block[i] : static_cast<int8_t>(block[i]));
  }
  std::free(block);
  return out;
}

// The rotation written out pixel by pixel as plainly as possible: canvas from the turned
// corners, then every canvas pixel mapped back afresh and tested before any source byte is
// read. 64-bit, which for the sizes used here is exactly the 32-bit arithmetic.
Canvas reference(Kind kind, const std::vector<int> &src, int64_t h, int64_t w, uint8_t angle) {
  const int64_t cos_a = tq_cos_(angle), sin_a = tq_sin_(angle);
  const int64_t xs[] = {0, cos_a * w / 16384, -(sin_a * h / 16384),
                        (cos_a * w - sin_a * h) / 16384};
  const int64_t ys[] = {0, sin_a * w / 16384, cos_a * h / 16384, (sin_a * w + cos_a * h) / 16384};
  int64_t x_min = 0, x_max = 0, y_min = 0, y_max = 0;
  for (int i = 0; i < 4; ++i) {
    x_min = std::min(x_min, xs[i]), x_max = std::max(x_max, xs[i]);
    y_min = std::min(y_min, ys[i]), y_max = std::max(y_max, ys[i]);
  }
  Canvas out;
  out.made = true;
  out.height = static_cast<int32_t>(y_max - y_min + 1);
  out.width = static_cast<int32_t>(x_max - x_min + 1);
  out.offset_y = static_cast<int32_t>(-y_min);
  out.offset_x = static_cast<int32_t>(-x_min);
  out.pixels.assign(static_cast<size_t>(out.height) * static_cast<size_t>(out.width),
                    fill_of(kind));
  const uint8_t opposite = static_cast<uint8_t>(-angle & 255);
  const int64_t cos_b = tq_cos_(opposite), sin_b = tq_sin_(opposite);
  for (int64_t r = 0; r < out.height; ++r) {
    for (int64_t k = 0; k < out.width; ++k) {
      const int64_t dx = k - out.offset_x, dy = r - out.offset_y;
      const int64_t sx = cos_b * dx - sin_b * dy, sy = sin_b * dx + cos_b * dy;
      const int64_t x0 = sx >> 14, y0 = sy >> 14, fx = sx & 16383, fy = sy & 16383;
      int &pixel = out.pixels[static_cast<size_t>(r * out.width + k)];
      if (kind == Kind::kNearest) {
        if (x0 < 0 || y0 < 0 || y0 >= h || x0 >= w) continue;
        const int v = src[static_cast<size_t>(y0 * w + x0)];
        pixel = v == -128 ? -127 : v;
        continue;
      }
      if (!(0 <= x0 && x0 + 1 < w && 0 <= y0 && y0 + 1 < h)) continue;
      auto at = [&](int64_t x, int64_t y) { return int64_t{src[static_cast<size_t>(y * w + x)]}; };
      const int64_t top = (16384 - fx) * at(x0, y0) + fx * at(x0 + 1, y0);
      const int64_t bottom = (16384 - fx) * at(x0, y0 + 1) + fx * at(x0 + 1, y0 + 1);
      // C++ division truncates toward zero, which is the rule for both pixel types.
      pixel = static_cast<int>(((16384 - fy) * top + fy * bottom) / (int64_t{1} << 28));
    }
  }
  return out;
}

std::vector<int> random_source(Kind kind, int64_t count, std::mt19937 &rng) {
  std::uniform_int_distribution<int> value(kind == Kind::kUnsigned ? 0 : -128,
                                           kind == Kind::kUnsigned ? 255 : 127);
  std::vector<int> src(static_cast<size_t>(count));
  for (int &v : src) v = value(rng);
  return src;
}

// 3 rows x 4 columns; F stands for the routine's fill value.
const std::vector<int> kSmall = {0, 1, 2, 3, 10, 11, 12, 13, 20, 21, 22, 23};
constexpr int F = 1000;

struct QuarterCase {
  uint8_t angle;
  int32_t offset_y, offset_x;
  std::vector<std::vector<int>> rows;
};

const QuarterCase kBilinearQuarters[] = {
    {0, 0, 0, {{0, 1, 2, F, F}, {10, 11, 12, F, F}, {F, F, F, F, F}, {F, F, F, F, F}}},
    {64, 0, 3, {{F, F, 10, 0}, {F, F, 11, 1}, {F, F, 12, 2}, {F, F, F, F}, {F, F, F, F}}},
    {128, 3, 4, {{F, F, F, F, F}, {F, F, F, F, F}, {F, F, 12, 11, 10}, {F, F, 2, 1, 0}}},
    {192, 4, 0, {{F, F, F, F}, {F, F, F, F}, {2, 12, F, F}, {1, 11, F, F}, {0, 10, F, F}}},
};

const QuarterCase kNearestQuarters[] = {
    {0, 0, 0, {{0, 1, 2, 3, F}, {10, 11, 12, 13, F}, {20, 21, 22, 23, F}, {F, F, F, F, F}}},
    {64, 0, 3, {{F, 20, 10, 0}, {F, 21, 11, 1}, {F, 22, 12, 2}, {F, 23, 13, 3}, {F, F, F, F}}},
    {128, 3, 4, {{F, F, F, F, F}, {F, 23, 22, 21, 20}, {F, 13, 12, 11, 10}, {F, 3, 2, 1, 0}}},
    {192, 4, 0, {{F, F, F, F}, {3, 13, 23, F}, {2, 12, 22, F}, {1, 11, 21, F}, {0, 10, 20, F}}},
};

void expect_quarter(Kind kind, const QuarterCase &c) {
  SCOPED_TRACE(testing::Message() << "kind " << static_cast<int>(kind) << " angle "
                                  << int{c.angle});
  Canvas want;
  want.made = true;
  want.height = static_cast<int32_t>(c.rows.size());
  want.width = static_cast<int32_t>(c.rows[0].size());
  want.offset_y = c.offset_y;
  want.offset_x = c.offset_x;
  for (const auto &row : c.rows) {
    for (int v : row) want.pixels.push_back(v == F ? fill_of(kind) : v);
  }
  EXPECT_EQ(run(kind, kSmall, 3, 4, c.angle), want);
}

TEST(Rotation, QuarterTurnsOfASmallSource) {
  for (const QuarterCase &c : kBilinearQuarters) {
    for (Kind kind : kBilinearKinds) expect_quarter(kind, c);
  }
  for (const QuarterCase &c : kNearestQuarters) expect_quarter(Kind::kNearest, c);
}

struct SizeCase {
  uint8_t angle;
  int64_t height, width;
  int32_t canvas_height, canvas_width, offset_y, offset_x;
};

const SizeCase kSizes[] = {
    {16, 4, 4, 6, 5, 0, 1},       // corners truncate to X = 3, -1, 2 and Y = 1, 3, 5
    {32, 10, 20, 22, 22, 0, 7},   //
    {32, 20, 10, 22, 22, 0, 14},  //
    {0, 0, 0, 1, 1, 0, 0},        // no pixels: still a one-pixel canvas
    {100, 0, 0, 1, 1, 0, 0},      //
    {0, 1, 1, 2, 2, 0, 0},        //
};

TEST(Rotation, CanvasSizeAndOffsets) {
  for (const SizeCase &c : kSizes) {
    for (Kind kind : kKinds) {
      SCOPED_TRACE(testing::Message() << "kind " << static_cast<int>(kind) << " angle "
                                      << int{c.angle} << " " << c.height << "x" << c.width);
      std::vector<int> src(static_cast<size_t>(c.height * c.width), 7);
      const Canvas got = run(kind, src, c.height, c.width, c.angle);
      EXPECT_EQ(got.height, c.canvas_height);
      EXPECT_EQ(got.width, c.canvas_width);
      EXPECT_EQ(got.offset_y, c.offset_y);
      EXPECT_EQ(got.offset_x, c.offset_x);
      if (c.height == 0) {
        EXPECT_EQ(got.pixels, std::vector<int>{fill_of(kind)});
      }
    }
  }
}

// Nearest neighbour reaches the last row and column, so it copies a line at angle 0 (a bilinear
// rotation of a line shows nothing: the per-pixel comparison below covers those).
TEST(Rotation, NearestCopiesThinSources) {
  const std::vector<int> line = {1, 2, 3, 4, 5, 6, 7};
  const int M = -128;
  EXPECT_EQ(run(Kind::kNearest, line, 1, 7, 0).pixels,
            (std::vector<int>{1, 2, 3, 4, 5, 6, 7, M, M, M, M, M, M, M, M, M}));
  EXPECT_EQ(run(Kind::kNearest, line, 7, 1, 0).pixels,
            (std::vector<int>{1, M, 2, M, 3, M, 4, M, 5, M, 6, M, 7, M, M, M}));
  EXPECT_EQ(run(Kind::kNearest, {-128}, 1, 1, 0).pixels, (std::vector<int>{-127, M, M, M}));
}

// At angle 50, canvas pixel (3, 8) of a 13 x 13 source shows column 4 + 8192/16384, so between
// a source whose columns 0..4 hold `left` and 5..12 hold `right` it is their exact mean.
TEST(Rotation, HalfwayBetweenColumnsTruncatesTowardZero) {
  const int64_t sx = tq_cos_(206) * (3 - 12) - tq_sin_(206) * (8 - 0);  // opposite of 50
  ASSERT_EQ(sx, 4 * 16384 + 8192);  // the premise, from our cosine table
  const struct {
    Kind kind;
    int left, right, shown;
  } kHalfway[] = {
      {Kind::kUnsigned, 0, 255, 127},  // 127.5 truncated
      {Kind::kSigned, -128, 127, 0},   // -0.5 truncated toward zero, not down to -1
      {Kind::kSigned, 127, -128, 0},   //
      {Kind::kSigned, -3, -2, -2},     // -2.5
      {Kind::kSigned, 5, 6, 5},        //
      {Kind::kNearest, -128, 127, -127},
  };
  for (const auto &c : kHalfway) {
    SCOPED_TRACE(testing::Message() << c.left << " " << c.right);
    std::vector<int> src;
    for (int i = 0; i < 13 * 13; ++i) src.push_back(i % 13 <= 4 ? c.left : c.right);
    const Canvas got = run(c.kind, src, 13, 13, 50);
    ASSERT_EQ(got.offset_x, 12);
    ASSERT_EQ(got.offset_y, 0);
    EXPECT_EQ(got.pixels[static_cast<size_t>(8 * got.width + 3)], c.shown);
  }
}

using kel_test::for_each_variant;

// The routines step positions along each row, skip the uncovered runs and hand long runs to
// the vector variants; every canvas must equal the plain per-pixel mapping, at every angle, for
// odd sizes, runs longer than any vector and of every remainder: random pixels, and the extremes
// in a checkerboard and in stripes, where the bilinear totals are largest and, for signed
// pixels, land on both sides of zero.
TEST(Rotation, MatchesThePlainPerPixelMapping) {
  std::mt19937 rng(99);
  const int64_t sizes[][2] = {{1, 1},   {2, 2},   {3, 5},  {7, 4},  {13, 13}, {2, 17}, {31, 23},
                              {40, 70}, {70, 40}, {2, 97}, {97, 2}, {33, 33}, {5, 131}};
  for_each_variant([&] {
    for (Kind kind : kKinds) {
      const int low = kind == Kind::kUnsigned ? 0 : -128, high = low + 255;
      for (const auto &size : sizes) {
        const int64_t h = size[0], w = size[1];
        std::vector<std::vector<int>> sources = {random_source(kind, h * w, rng), {}, {}};
        for (int64_t i = 0; i < h * w; ++i) {
          sources[1].push_back((i / w + i % w) % 2 ? high : low);
          sources[2].push_back((i % w) % 3 == 0 ? low : high);
        }
        for (const std::vector<int> &src : sources) {
          for (int a = 0; a < 256; ++a) {
            const uint8_t angle = static_cast<uint8_t>(a);
            ASSERT_EQ(run(kind, src, h, w, angle), reference(kind, src, h, w, angle))
                << "kind " << static_cast<int>(kind) << " " << h << "x" << w << " angle " << a;
          }
        }
      }
    }
  });
}

// The vector variants take sides below 2^16: at 65535 they still run, above they leave the run to
// the 64-bit loop, which also carries sides whose products leave 32 bits.
TEST(Rotation, LongSidesGiveTheTrueRotation) {
  std::mt19937 rng(3);
  const int64_t sizes[][2] = {{3, 65535}, {3, 65536}, {2, 70000}};
  for_each_variant([&] {
    for (Kind kind : kKinds) {
      for (const auto &size : sizes) {
        const std::vector<int> src = random_source(kind, size[0] * size[1], rng);
        for (int a : {0, 64, 128, 192}) {
          const uint8_t angle = static_cast<uint8_t>(a);
          EXPECT_EQ(run(kind, src, size[0], size[1], angle),
                    reference(kind, src, size[0], size[1], angle));
          EXPECT_EQ(run(kind, src, size[1], size[0], angle),
                    reference(kind, src, size[1], size[0], angle));
        }
      }
    }
  });
}

// Sizes no canvas can be made for give a null canvas, and the source (null here) is never read;
// negative nearest-neighbour sizes cover nothing.
TEST(Rotation, ExtremeSizesReadNothing) {
  for (int a : {0, 32, 40, 64, 130, 200}) {
    const uint8_t angle = static_cast<uint8_t>(a);
    for (Kind kind : kBilinearKinds) {
      // Sides beyond int32_t: all four sizes and offsets are 0.
      const Canvas got = run(kind, {}, UINT32_MAX, UINT32_MAX, angle);
      EXPECT_FALSE(got.made);
      EXPECT_EQ(got.height | got.width | got.offset_y | got.offset_x, 0);
      EXPECT_FALSE(run(kind, {}, UINT32_MAX, 0, angle).made);
    }
    EXPECT_FALSE(run(Kind::kNearest, {}, INT32_MAX, INT32_MAX, angle).made);
    EXPECT_FALSE(run(Kind::kNearest, {}, INT32_MIN, INT32_MIN, angle).made);
    for (const auto &size : {std::pair<int64_t, int64_t>{-5, 7}, {6, -3}, {-4, -9}}) {
      const Canvas got = run(Kind::kNearest, {}, size.first, size.second, angle);
      EXPECT_EQ(got, reference(Kind::kNearest, {}, size.first, size.second, angle));
      EXPECT_EQ(got.pixels, std::vector<int>(got.pixels.size(), -128));
    }
  }
  if (SIZE_MAX > UINT32_MAX) {
    // 2^62 bytes: representable, but malloc fails; the sizes asked for are still reported.
    for (Kind kind : kKinds) {
      const Canvas got = run(kind, {}, INT32_MAX - 1, INT32_MAX - 1, 0);
      EXPECT_FALSE(got.made);
      EXPECT_EQ(got.height, INT32_MAX);
      EXPECT_EQ(got.width, INT32_MAX);
      EXPECT_EQ(got.offset_y | got.offset_x, 0);
    }
  }
}

}  // namespace
