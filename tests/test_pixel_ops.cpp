#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <cstdint>
#include <random>
#include <string>
#include <utility>
#include <vector>

#include "kel_images.h"
#include "kel_outside.h"
#include "test_support.h"

namespace {

using kel_test::Bytes;
using kel_test::random_bytes;

// ---- Brighten, darken and the mask ------------------------------------------------------------

using PointOp = void (*)(const uint8_t *, uint32_t, uint32_t, uint32_t, uint8_t *);

TEST(PointOps, WorkedValuesOutOfPlaceAndInPlace) {
  const struct {
    PointOp op;
    uint32_t percent;
    Bytes in, out;
  } kCases[] = {
      {kel_image_brighten, 50, {0, 1, 2, 99, 200, 254, 255}, {127, 128, 128, 177, 227, 254, 255}},
      {kel_image_brighten, 99, {0, 155, 254}, {252, 254, 254}},
      {kel_image_brighten, 1, {0, 99, 155, 156}, {2, 100, 156, 156}},
      {kel_image_darken, 50, {255, 254, 200, 100, 99, 2, 1, 0}, {128, 127, 100, 50, 50, 1, 1, 0}},
      {kel_image_darken, 99, {255, 100, 1}, {3, 1, 1}},
      {kel_image_darken, 1, {255, 100, 99}, {253, 99, 99}},
  };
  for (const auto &c : kCases) {
    SCOPED_TRACE(testing::Message()
                 << (c.op == kel_image_darken ? "darken " : "brighten ") << c.percent);
    const uint32_t count = static_cast<uint32_t>(c.in.size());
    Bytes out(count, 0xAA), in_place = c.in;
    c.op(c.in.data(), 1, count, c.percent, out.data());
    c.op(in_place.data(), count, 1, c.percent, in_place.data());
    EXPECT_EQ(out, c.out);
    EXPECT_EQ(in_place, c.out);
  }
}

// The fast arithmetic must equal the plain formula for every value and percentage; percentages
// of 100 or more act as 100, and the two operations mirror each other.
TEST(PointOps, EqualThePlainFormulaForEveryValueAndPercent) {
  Bytes all(256);
  for (int v = 0; v < 256; ++v) all[v] = static_cast<uint8_t>(v);
  std::vector<uint32_t> percents = {150u, 65536u + 50u, UINT32_MAX};
  for (uint32_t p = 0; p <= 101; ++p) percents.push_back(p);
  for (uint32_t percent : percents) {
    const uint32_t p = std::min(percent, 100u);
    Bytes up(256), down(256);
    kel_image_brighten(all.data(), 16, 16, percent, up.data());
    kel_image_darken(all.data(), 16, 16, percent, down.data());
    for (uint32_t s = 0; s < 256; ++s) {
      ASSERT_EQ(up[s], s + p * (255 - s) / 100) << s << " " << percent;
      ASSERT_EQ(down[s], s - p * s / 100) << s << " " << percent;
      ASSERT_EQ(up[s], 255 - down[255 - s]) << s << " " << percent;
    }
  }
}

// Each call writes exactly height * width bytes, counted in 32 bits, from its start.
TEST(PointOps, PixelCountWrapsIn32Bits) {
  const uint32_t kSizes[][3] = {{0, 5, 0}, {5, 0, 0}, {65536, 65536, 0}, {65537, 65537, 131073}};
  for (const auto &c : kSizes) {
    SCOPED_TRACE(testing::Message() << c[0] << " x " << c[1]);
    const Bytes src(c[2] + 16, 200);
    Bytes dst(c[2] + 16, 9);
    kel_image_brighten(src.data(), c[0], c[1], 100, dst.data());
    kel_image_darken(src.data(), c[0], c[1], 100, dst.data() + 1);
    kel_get_mask(src.data(), c[0], c[1], 200, dst.data() + 2);
    Bytes expected(c[2] + 16, 9);
    if (c[2] > 0) {
      expected[0] = 255;
      std::fill_n(expected.begin() + 1, c[2] + 1, 0);
    }
    EXPECT_EQ(dst, expected);
  }
}

TEST(GetMask, ZeroExactlyWhereThePixelEqualsTheKey) {
  const Bytes image = {7, 0, 7, 255, 8}, none = {1, 1, 1, 1, 1};
  const std::pair<int32_t, Bytes> kCases[] = {
      {7, {0, 1, 0, 1, 1}}, {0, {1, 0, 1, 1, 1}}, {255, {1, 1, 1, 0, 1}}, {256, none},
      {-1, none},           {INT32_MIN, none},    {7 + 256, none}};
  for (const auto &c : kCases) {
    Bytes mask(5, 0xAA), in_place = image;
    kel_get_mask(image.data(), 1, 5, c.first, mask.data());
    kel_get_mask(in_place.data(), 5, 1, c.first, in_place.data());
    EXPECT_EQ(mask, c.second) << c.first;
    EXPECT_EQ(in_place, c.second) << c.first;
  }
}

// ---- Paste and blend ----------------------------------------------------------------------------

using CompositeOp = void (*)(uint8_t *, int32_t, int32_t, const uint8_t *, uint16_t, uint16_t,
                             int32_t, int32_t, uint16_t);

uint8_t blended(uint8_t d, uint8_t s) {
  return static_cast<uint8_t>((d + s) >> 1);
}

// The plain way: every source pixel in row-major order, read just before its target is written.
void reference_composite(bool blend, uint8_t *dst, int64_t dst_height, int64_t dst_width,
                         const uint8_t *src, int64_t src_height, int64_t src_width, int64_t x,
                         int64_t y, uint16_t key) {
  for (int64_t sy = 0; sy < src_height; ++sy) {
    for (int64_t sx = 0; sx < src_width; ++sx) {
      const int64_t dx = x + sx, dy = y + sy;
      if (dx < 0 || dx >= dst_width || dy < 0 || dy >= dst_height) continue;
      const uint8_t s = src[sy * src_width + sx];
      if (key <= 255 && s == key) continue;
      uint8_t &d = dst[dy * dst_width + dx];
      d = blend ? blended(d, s) : s;
    }
  }
}

TEST(Composite, KeyMakesExactlyThatSourceValueTransparent) {
  const Bytes source = {0, 255, 7, 0, 255, 1}, under = {255, 100, 100, 2, 255, 2};
  // Blending covers 0 over 255 -> 127, 1 over 2 -> 1 and 255 over 255 -> 255.
  const struct {
    uint16_t key;
    Bytes pasted, blended;
  } kCases[] = {
      {0, {255, 255, 7, 2, 255, 1}, {255, 177, 53, 2, 255, 1}},
      {255, {0, 100, 7, 0, 255, 1}, {127, 100, 53, 1, 255, 1}},
      {7, {0, 255, 100, 0, 255, 1}, {127, 177, 100, 1, 255, 1}},
      {256, {0, 255, 7, 0, 255, 1}, {127, 177, 53, 1, 255, 1}},
      {65535, {0, 255, 7, 0, 255, 1}, {127, 177, 53, 1, 255, 1}},
  };
  for (const auto &c : kCases) {
    Bytes pasted = under, blend = under;
    kel_image_draw_image(pasted.data(), 2, 3, source.data(), 2, 3, 0, 0, c.key);
    kel_image_blend_image(blend.data(), 2, 3, source.data(), 2, 3, 0, 0, c.key);
    EXPECT_EQ(pasted, c.pasted) << c.key;
    EXPECT_EQ(blend, c.blended) << c.key;
  }
}

struct Placement {
  int32_t dst_offset, src_offset, dst_height, dst_width, src_height, src_width, x, y;
};

// Runs both routines on one buffer, with and without a key, against the plain visiting order.
// Values 0..7 make the key 3 dense; 0..255 leave long stretches without it; 2s and 4s hold no 3
// at first, but their blends are 3s written ahead of the pixels still to be read.
void expect_plain_order(const Placement &c) {
  for (int high : {7, 255, 4}) {
    for (uint16_t key : {uint16_t{256}, uint16_t{3}}) {
      for (bool blend : {false, true}) {
        SCOPED_TRACE(testing::Message()
                     << c.dst_offset << " " << c.src_offset << " " << c.dst_height << "x"
                     << c.dst_width << " at " << c.x << ", " << c.y << " key " << key << " blend "
                     << blend << " values up to " << high);
        Bytes expected = random_bytes(4096, 11, 0, high);
        if (high == 4) {
          for (uint8_t &v : expected) v = v < 3 ? 2 : 4;
        }
        Bytes actual = expected;
        reference_composite(blend, expected.data() + c.dst_offset, c.dst_height, c.dst_width,
                            expected.data() + c.src_offset, c.src_height, c.src_width, c.x, c.y,
                            key);
        const CompositeOp op = blend ? kel_image_blend_image : kel_image_draw_image;
        op(actual.data() + c.dst_offset, c.dst_height, c.dst_width, actual.data() + c.src_offset,
           static_cast<uint16_t>(c.src_height), static_cast<uint16_t>(c.src_width), c.x, c.y, key);
        ASSERT_EQ(actual, expected);
      }
    }
  }
}

// Separate rasters at every placement around a 4 x 6 destination, empty sizes, and placements
// that break the caller's no-overflow promise.
TEST(Composite, ClippingMatchesThePlainVisitingOrder) {
  std::vector<Placement> cases;
  for (int32_t y = -4; y <= 5; ++y) {
    for (int32_t x = -5; x <= 7; ++x) cases.push_back({0, 1000, 4, 6, 3, 4, x, y});
  }
  for (int32_t extreme : {INT32_MIN, INT32_MAX}) {
    cases.push_back({0, 1000, 4, 6, 3, 4, extreme, 0});
    cases.push_back({0, 1000, 4, 6, 3, 4, 0, extreme});
  }
  const int32_t kSizes[][4] = {{4, 6, 0, 4},
                               {4, 6, 3, 0},
                               {0, 6, 3, 4},
                               {4, 0, 3, 4},
                               {-1, 6, 3, 4},
                               {4, -5, 3, 4},
                               {INT32_MIN, INT32_MIN, 3, 4}};
  for (const auto &s : kSizes) cases.push_back({0, 1000, s[0], s[1], s[2], s[3], -1, -1});
  for (const Placement &c : cases) expect_plain_order(c);
}

// Source and destination inside one buffer, the destination before, on and after the source,
// with short and long distances and widths that differ: the row copy must still act as a
// left-to-right pixel copy.
TEST(Composite, OverlappingRastersMatchThePlainVisitingOrder) {
  const Placement kCases[] = {
      {1, 0, 20, 40, 10, 40, 0, 0},     {3, 0, 20, 40, 10, 40, 0, 0},
      {17, 0, 20, 40, 10, 40, 0, 0},    {0, 1, 20, 40, 10, 40, 0, 0},
      {0, 17, 20, 40, 10, 40, 0, 0},    {0, 0, 20, 40, 10, 40, 0, 0},
      {0, 0, 20, 40, 10, 40, 5, 0},     {0, 0, 20, 40, 10, 40, -5, 1},
      {0, 0, 20, 40, 10, 40, 3, 1},     {0, 40, 20, 40, 10, 37, 2, 0},
      {0, 0, 20, 33, 12, 29, 4, 2},     {50, 0, 15, 31, 19, 45, -2, -1},
      {0, 0, 20, 40, 10, 40, 39, 19},   {2, 0, 10, 300, 3, 300, 0, 0},
      {0, 0, 10, 300, 3, 299, 100, 0},  {0, 5, 10, 300, 3, 300, 0, 0},
      {0, 0, 10, 300, 3, 300, -100, 0},
  };
  for (const Placement &c : kCases) expect_plain_order(c);
}

// ---- Masked-region fill, with our default blur and enlargement ---------------------------------

// When every border pixel holds 60, the grid fills with 60 and a constant grid stays constant
// through blur and enlargement: every hole pixel becomes 60, and the interior seam then takes
// the blur of that picture. Known pixels beside the hole on the image's edge hold 250, which
// would show in a hole pixel on the edge if it were softened.
TEST(MaskImage, ConstantEdgeFillsTheHoleAndSoftensOnlyTheInteriorSeam) {
  const struct {
    const char *what;
    uint16_t height, width;
    std::vector<std::vector<int>> holes;  // x0, y0, x1, y1
  } kCases[] = {
      {"one cell spreads to the whole grid", 64, 72, {{30, 30, 30, 30}}},
      {"hole in the first and last rows", 24, 16, {{3, 0, 7, 6}, {9, 17, 13, 23}}},
      {"hole in the first and last columns", 19, 21, {{0, 4, 5, 9}, {15, 10, 20, 14}}},
      {"sides not multiples of 8", 29, 35, {{10, 9, 27, 22}, {2, 2, 2, 2}}},
      {"everything but a ring", 40, 40, {{0, 0, 39, 9}, {0, 10, 9, 39}, {12, 12, 39, 39}}},
  };
  for (const auto &c : kCases) {
    SCOPED_TRACE(c.what);
    const size_t count = size_t{c.height} * c.width;
    Bytes mask_values(count, 1);
    for (const std::vector<int> &r : c.holes) {
      for (int y = r[1]; y <= r[3]; ++y) {
        for (int x = r[0]; x <= r[2]; ++x) mask_values[size_t(y) * c.width + x] = 0;
      }
    }
    const kel_test::Mask mask{c.height, c.width, mask_values.data()};
    Bytes src(count, 200), filled(count);
    for (int i = 0; i < int(count); ++i) {
      const int x = i % c.width, y = i / c.width;
      if (!mask.hole(x, y) && mask.next_to(x, y, true)) src[i] = mask.interior(x, y) ? 60 : 250;
      filled[i] = mask.hole(x, y) ? 60 : src[i];
    }
    Bytes expected = filled, blurred(count), dst(count, 0xAA);
    kel_blur_uint8(filled.data(), c.height, c.width, blurred.data());
    for (int i = 0; i < int(count); ++i) {
      if (mask.seam(i % c.width, i / c.width)) expected[i] = blurred[i];
    }
    kel_mask_image(src.data(), c.height, c.width, mask_values.data(), dst.data());
    EXPECT_EQ(dst, expected);
  }
}

// ---- Our default blur and enlargement ----------------------------------------------------------

TEST(DefaultBlur, ImpulseGivesTheBinomialKernel) {
  Bytes impulse(25, 0), out(25, 0xAA);
  impulse[12] = 255;
  kel_blur_uint8(impulse.data(), 5, 5, out.data());
  // clang-format off
  EXPECT_EQ(out, (Bytes{0,  0,  0,  0, 0,
                        0, 16, 32, 16, 0,
                        0, 32, 64, 32, 0,
                        0, 16, 32, 16, 0,
                        0,  0,  0,  0, 0}));
  // clang-format on
}

// Random pictures of four kinds: any values, only 0 and 255, only the top values, only the
// bottom ones; the kind and the values follow from the seed.
Bytes random_picture(size_t count, uint32_t seed) {
  const int kinds[4][2] = {{0, 255}, {0, 1}, {250, 255}, {0, 3}};
  const auto &kind = kinds[seed % 4];
  Bytes picture = random_bytes(count, seed, kind[0], kind[1]);
  if (seed % 4 == 1) {
    for (uint8_t &p : picture) p = static_cast<uint8_t>(p * 255);
  }
  return picture;
}

// The documented blur, pixel by pixel: [1 2 1] / 4 along the rows, then along the columns, each
// pass rounded half up, edges repeated.
Bytes documented_blur(const Bytes &in, int height, int width) {
  const auto pass = [height, width](const Bytes &from, int dx, int dy) {
    const auto at = [&](int x, int y) {
      return int{from[size_t(std::clamp(y, 0, height - 1)) * width + std::clamp(x, 0, width - 1)]};
    };
    Bytes to(from.size());
    for (int i = 0; i < int(from.size()); ++i) {
      const int x = i % width, y = i / width;
      to[i] = uint8_t((at(x - dx, y - dy) + 2 * at(x, y) + at(x + dx, y + dy) + 2) >> 2);
    }
    return to;
  };
  return pass(pass(in, 1, 0), 0, 1);
}

// The vector loops against the documented kernel, in place and apart, on single rows and
// columns, widths around the 256-column strips and many random sizes whose sides are not
// multiples of any vector; nothing outside the output is written.
TEST(DefaultBlur, MatchesTheDocumentedKernelInAndOutOfPlace) {
  std::vector<std::pair<int, int>> sizes = {{1, 1},   {1, 2},   {2, 1},   {2, 2},
                                            {1, 300}, {300, 1}, {7, 255}, {7, 256},
                                            {7, 257}, {5, 513}, {33, 600}};
  std::mt19937 rng(3);
  std::uniform_int_distribution<int> side(1, 70);
  for (int i = 0; i < 200; ++i) sizes.emplace_back(side(rng), side(rng));
  for (const auto &[height, width] : sizes) {
    SCOPED_TRACE(testing::Message() << height << " x " << width);
    const size_t count = size_t(height) * width;
    const Bytes in = random_picture(count, uint32_t(count + sizes.size()));
    kel_test::Guarded out(count, 0xAA), in_place(count, 0);
    std::copy(in.begin(), in.end(), in_place.data());
    kel_blur_uint8(in.data(), uint16_t(height), uint16_t(width), out.data());
    kel_blur_uint8(in_place.data(), uint16_t(height), uint16_t(width), in_place.data());
    const Bytes expected = documented_blur(in, height, width);
    ASSERT_EQ(out.inside(), expected);
    ASSERT_EQ(in_place.inside(), expected);
    ASSERT_TRUE(out.guards_intact() && in_place.guards_intact());
  }
  kel_blur_uint8(nullptr, 0, 5, nullptr);
  kel_blur_uint8(nullptr, 5, 0, nullptr);
}

// The documented arithmetic, pixel by pixel: the centre of output pixel i lies at input
// position (2i + 1 - factor) / (2 factor), clamped to the first and last sample; the weight of
// the second sample is rounded down to 1/256; the total is rounded half up. Nothing to enlarge
// gives 0.
uint8_t documented_scale(const Bytes &in, int in_height, int in_width, int factor, int x, int y) {
  if (in_height == 0 || in_width == 0 || factor == 0) return 0;
  struct Sample {
    int first, second, weight;
  };
  auto locate = [factor](int i, int size) {
    const int scaled = 2 * i + 1 - factor, span = 2 * factor;
    if (scaled <= 0) return Sample{0, 0, 0};
    if (scaled / span >= size - 1) return Sample{size - 1, size - 1, 0};
    return Sample{scaled / span, scaled / span + 1, (scaled % span) * 256 / span};
  };
  const Sample c = locate(x, in_width), r = locate(y, in_height);
  auto at = [&](int row, int col) { return uint32_t{in[size_t(row) * in_width + col]}; };
  const uint32_t upper = at(r.first, c.first) * (256 - c.weight) + at(r.first, c.second) * c.weight;
  const uint32_t lower =
      at(r.second, c.first) * (256 - c.weight) + at(r.second, c.second) * c.weight;
  return static_cast<uint8_t>((upper * (256 - r.weight) + lower * r.weight + 32768) >> 16);
}

// Every output pixel is written as documented (outputs prefilled with 0 and with 255 agree) and
// nothing beyond it: outputs of the enlarged size, larger (the edge repeats), smaller, and far
// wider than the enlarged input, which leaves whole strips of columns beyond the last sample.
// The factor 8, the fill's, has loops of its own; it takes most of the random cases.
TEST(DefaultScale, WritesEveryPixelAsDocumented) {
  std::vector<std::array<int, 5>> cases = {
      {3, 4, 8, 24, 32}, {5, 300, 8, 40, 2400}, {7, 9, 3, 23, 29}, {4, 200, 1, 4, 200},
      {6, 5, 2, 14, 13}, {2, 3, 5, 10, 15},     {3, 4, 8, 30, 40}, {1, 1, 8, 8, 8},
      {2, 2, 1, 9, 9},   {0, 4, 8, 3, 5},       {4, 0, 8, 3, 5},   {4, 4, 0, 3, 5},
      {4, 4, 3, 5, 5},   {1, 2, 8, 3, 900},     {2, 1, 8, 9, 5},   {33, 70, 8, 264, 560}};
  std::mt19937 rng(4);
  std::uniform_int_distribution<int> side(1, 40), more(0, 11), wide(300, 700);
  const int kFactors[] = {8, 8, 8, 8, 1, 2, 3, 4, 7, 16};
  for (int i = 0; i < 120; ++i) {
    const int h = side(rng), w = side(rng), f = kFactors[i % 10];
    switch (i % 4) {
      case 0:
        cases.push_back({h, w, f, h * f, w * f});
        break;
      case 1:
        cases.push_back({h, w, f, h * f + more(rng), w * f + more(rng)});
        break;
      case 2:
        cases.push_back({h, w, f, std::max(h * f - more(rng), 1), side(rng)});
        break;
      default:
        cases.push_back({h, w, f, more(rng) + 1, w * f + wide(rng)});
        break;
    }
  }
  for (const auto &c : cases) {
    SCOPED_TRACE(testing::Message()
                 << c[0] << " x " << c[1] << " by " << c[2] << " into " << c[3] << " x " << c[4]);
    const Bytes in = random_picture(size_t(c[0]) * c[1] + 1, uint32_t(c[2] + c[4]));
    const size_t count = size_t(c[3]) * c[4];
    Bytes expected(count);
    for (size_t i = 0; i < count; ++i) {
      expected[i] = documented_scale(in, c[0], c[1], c[2], int(i % c[4]), int(i / c[4]));
    }
    for (const uint8_t fill : {uint8_t{0}, uint8_t{255}}) {
      kel_test::Guarded out(count, fill);
      kel_scale_up_bilinear_uint8(in.data(), uint16_t(c[0]), uint16_t(c[1]), uint16_t(c[2]),
                                  out.data(), uint16_t(c[3]), uint16_t(c[4]));
      ASSERT_EQ(out.inside(), expected);
      ASSERT_TRUE(out.guards_intact());
    }
  }
  kel_scale_up_bilinear_uint8(nullptr, 0, 0, 8, nullptr, 0, 0);
}

}  // namespace
