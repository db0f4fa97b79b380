#include <gtest/gtest.h>

#include <algorithm>
#include <cstdint>
#include <random>
#include <string>
#include <utility>
#include <vector>

#include "kel_images.h"
#include "kel_outside.h"

namespace {

using Bytes = std::vector<uint8_t>;

Bytes random_bytes(size_t count, uint32_t seed, int low = 0, int high = 255) {
  std::mt19937 generator(seed);
  std::uniform_int_distribution<int> value(low, high);
  Bytes bytes(count);
  for (uint8_t &b : bytes) b = static_cast<uint8_t>(value(generator));
  return bytes;
}

// ---------------------------------------------------------------------------------------------
// Brighten and darken
// ---------------------------------------------------------------------------------------------

using PointOp = void (*)(const uint8_t *, uint32_t, uint32_t, uint32_t, uint8_t *);

struct PointCase {
  const char *name;
  PointOp op;
  uint32_t percent;
  Bytes in, out;
};

const PointCase kPointCases[] = {
    {"brighten",
     kel_image_brighten,
     50,
     {0, 1, 2, 99, 200, 254, 255},
     {127, 128, 128, 177, 227, 254, 255}},
    {"brighten", kel_image_brighten, 99, {0, 155, 254}, {252, 254, 254}},
    {"brighten", kel_image_brighten, 1, {0, 99, 155, 156}, {2, 100, 156, 156}},
    {"brighten", kel_image_brighten, 0, {0, 77, 255}, {0, 77, 255}},
    {"brighten", kel_image_brighten, 100, {0, 77, 255}, {255, 255, 255}},
    {"brighten", kel_image_brighten, 150, {0, 77, 255}, {255, 255, 255}},
    {"brighten", kel_image_brighten, UINT32_MAX, {0, 77, 255}, {255, 255, 255}},
    {"darken",
     kel_image_darken,
     50,
     {255, 254, 200, 100, 99, 2, 1, 0},
     {128, 127, 100, 50, 50, 1, 1, 0}},
    {"darken", kel_image_darken, 99, {255, 100, 1}, {3, 1, 1}},
    {"darken", kel_image_darken, 1, {255, 100, 99}, {253, 99, 99}},
    {"darken", kel_image_darken, 0, {0, 77, 255}, {0, 77, 255}},
    {"darken", kel_image_darken, 100, {0, 77, 255}, {0, 0, 0}},
    {"darken", kel_image_darken, 150, {0, 77, 255}, {0, 0, 0}},
    {"darken", kel_image_darken, UINT32_MAX, {0, 77, 255}, {0, 0, 0}},
};

TEST(PointOps, KnownValuesOutOfPlaceAndInPlace) {
  for (const PointCase &c : kPointCases) {
    SCOPED_TRACE(testing::Message() << c.name << " " << c.percent);
    const uint32_t count = static_cast<uint32_t>(c.in.size());
    Bytes out(count, 0xAA);
    c.op(c.in.data(), 1, count, c.percent, out.data());
    EXPECT_EQ(out, c.out);
    Bytes in_place = c.in;
    c.op(in_place.data(), count, 1, c.percent, in_place.data());
    EXPECT_EQ(in_place, c.out);
  }
}

// The 16-bit arithmetic must equal the 32-bit formula for every value and every percentage.
TEST(PointOps, EqualThePlainFormulaForEveryValueAndPercent) {
  Bytes all(256);
  for (int v = 0; v < 256; ++v) all[v] = static_cast<uint8_t>(v);
  std::vector<uint32_t> percents;
  for (uint32_t p = 0; p <= 101; ++p) percents.push_back(p);
  percents.insert(percents.end(), {150u, 65536u + 50u, UINT32_MAX});
  for (uint32_t percent : percents) {
    const uint32_t p = percent < 100 ? percent : 100;
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

TEST(PointOps, PixelCountWrapsIn32Bits) {
  struct SizeCase {
    uint32_t height, width, count;
  };
  const SizeCase kSizes[] = {
      {0, 5, 0}, {5, 0, 0}, {65536, 65536, 0}, {65537, 65537, 131073}, {1, 3, 3}};
  for (const SizeCase &c : kSizes) {
    SCOPED_TRACE(testing::Message() << c.height << " x " << c.width);
    const Bytes src(c.count + 16, 200);
    Bytes dst(c.count + 16, 9);
    kel_image_brighten(src.data(), c.height, c.width, 100, dst.data());
    kel_image_darken(src.data(), c.height, c.width, 100, dst.data() + 1);
    kel_get_mask(src.data(), c.height, c.width, 200, dst.data() + 2);
    // Each call writes exactly count bytes from its start; the bytes after them stay 9.
    for (size_t i = c.count + 2; i < dst.size(); ++i) ASSERT_EQ(dst[i], 9) << i;
    if (c.count > 0) {
      EXPECT_EQ(dst[0], 255);
      EXPECT_EQ(dst[1], 0);
      EXPECT_EQ(dst[c.count + 1], 0);
    }
  }
}

// ---------------------------------------------------------------------------------------------
// Mask extraction
// ---------------------------------------------------------------------------------------------

TEST(GetMask, ZeroExactlyWhereThePixelEqualsTheKey) {
  struct MaskCase {
    int32_t key;
    Bytes expected;
  };
  const Bytes image = {7, 0, 7, 255, 8};
  const MaskCase kCases[] = {{7, {0, 1, 0, 1, 1}},      {0, {1, 0, 1, 1, 1}},
                             {255, {1, 1, 1, 0, 1}},    {256, {1, 1, 1, 1, 1}},
                             {-1, {1, 1, 1, 1, 1}},     {INT32_MIN, {1, 1, 1, 1, 1}},
                             {7 + 256, {1, 1, 1, 1, 1}}};
  for (const MaskCase &c : kCases) {
    SCOPED_TRACE(c.key);
    Bytes mask(5, 0xAA);
    kel_get_mask(image.data(), 1, 5, c.key, mask.data());
    EXPECT_EQ(mask, c.expected);
    Bytes in_place = image;
    kel_get_mask(in_place.data(), 5, 1, c.key, in_place.data());
    EXPECT_EQ(in_place, c.expected);
  }
}

// ---------------------------------------------------------------------------------------------
// Paste and blend
// ---------------------------------------------------------------------------------------------

using CompositeOp = void (*)(uint8_t *, int32_t, int32_t, const uint8_t *, uint16_t, uint16_t,
                             int32_t, int32_t, uint16_t);

// A picture as a string, one row after another.
Bytes picture(const std::vector<std::string> &rows) {
  Bytes pixels;
  for (const std::string &row : rows) pixels.insert(pixels.end(), row.begin(), row.end());
  return pixels;
}

uint8_t blended(uint8_t d, uint8_t s) {
  return static_cast<uint8_t>((d + s) >> 1);
}

struct ClipCase {
  int32_t x, y;
  std::vector<std::string> pasted;  // the 4 x 6 destination after pasting "abcd/efgh/ijkl"
};

const std::vector<std::string> kUntouched = {"......", "......", "......", "......"};

const ClipCase kClipCases[] = {
    {1, 1, {"......", ".abcd.", ".efgh.", ".ijkl."}},
    {0, 0, {"abcd..", "efgh..", "ijkl..", "......"}},
    {-3, 0, {"d.....", "h.....", "l.....", "......"}},
    {0, -2, {"ijkl..", "......", "......", "......"}},
    {-1, -1, {"fgh...", "jkl...", "......", "......"}},
    {4, 2, {"......", "......", "....ab", "....ef"}},
    {5, 3, {"......", "......", "......", ".....a"}},
    {-3, -2, {"l.....", "......", "......", "......"}},
    {-4, 0, kUntouched},
    {6, 0, kUntouched},
    {0, -3, kUntouched},
    {0, 4, kUntouched},
    // Placements that break the caller's no-overflow promise are still clipped correctly.
    {INT32_MIN, 0, kUntouched},
    {INT32_MAX, 0, kUntouched},
    {0, INT32_MIN, kUntouched},
    {0, INT32_MAX, kUntouched},
};

TEST(Composite, ClipsAtEveryEdge) {
  const Bytes source = picture({"abcd", "efgh", "ijkl"});
  for (const ClipCase &c : kClipCases) {
    SCOPED_TRACE(testing::Message() << "x " << c.x << " y " << c.y);
    const Bytes pasted = picture(c.pasted);
    for (uint16_t key : {uint16_t{0}, uint16_t{255}, uint16_t{256}}) {
      Bytes dst = picture(kUntouched);
      kel_image_draw_image(dst.data(), 4, 6, source.data(), 3, 4, c.x, c.y, key);
      EXPECT_EQ(dst, pasted) << "paste, key " << key;
      dst = picture(kUntouched);
      kel_image_blend_image(dst.data(), 4, 6, source.data(), 3, 4, c.x, c.y, key);
      for (size_t i = 0; i < dst.size(); ++i) {
        ASSERT_EQ(dst[i], blended('.', pasted[i])) << "blend, key " << key << " at " << i;
      }
    }
  }
}

TEST(Composite, EmptySizesWriteNothing) {
  struct SizeCase {
    int32_t dst_height, dst_width;
    uint16_t src_height, src_width;
  };
  const SizeCase kSizes[] = {{4, 6, 0, 4},
                             {4, 6, 3, 0},
                             {0, 6, 3, 4},
                             {4, 0, 3, 4},
                             {-1, 6, 3, 4},
                             {4, -5, 3, 4},
                             {INT32_MIN, INT32_MIN, 3, 4}};
  const Bytes source(12, 'x');
  for (const SizeCase &c : kSizes) {
    for (CompositeOp op : {kel_image_draw_image, kel_image_blend_image}) {
      Bytes dst = picture(kUntouched);
      op(dst.data(), c.dst_height, c.dst_width, source.data(), c.src_height, c.src_width, -1, -1,
         256);
      EXPECT_EQ(dst, picture(kUntouched))
          << c.dst_height << " " << c.dst_width << " " << c.src_height << " " << c.src_width;
    }
  }
}

TEST(Composite, KeyMakesExactlyThatSourceValueTransparent) {
  struct KeyCase {
    uint16_t key;
    Bytes pasted, blended;
  };
  const Bytes source = {0, 255, 7, 0, 255, 1};
  const Bytes under = {255, 100, 100, 2, 255, 2};
  // Blending covers 0 over 255 -> 127, 1 over 2 -> 1 and 255 over 255 -> 255.
  const KeyCase kCases[] = {
      {0, {255, 255, 7, 2, 255, 1}, {255, 177, 53, 2, 255, 1}},
      {255, {0, 100, 7, 0, 255, 1}, {127, 100, 53, 1, 255, 1}},
      {7, {0, 255, 100, 0, 255, 1}, {127, 177, 100, 1, 255, 1}},
      {256, {0, 255, 7, 0, 255, 1}, {127, 177, 53, 1, 255, 1}},
      {65535, {0, 255, 7, 0, 255, 1}, {127, 177, 53, 1, 255, 1}},
  };
  for (const KeyCase &c : kCases) {
    SCOPED_TRACE(c.key);
    Bytes dst = under;
    kel_image_draw_image(dst.data(), 2, 3, source.data(), 2, 3, 0, 0, c.key);
    EXPECT_EQ(dst, c.pasted);
    dst = under;
    kel_image_blend_image(dst.data(), 2, 3, source.data(), 2, 3, 0, 0, c.key);
    EXPECT_EQ(dst, c.blended);
  }
}

// The plain way: every source pixel in row-major order, read just before its target is written.
void reference_composite(bool blend, uint8_t *dst, int32_t dst_height, int32_t dst_width,
                         const uint8_t *src, int32_t src_height, int32_t src_width, int32_t x,
                         int32_t y, uint16_t key) {
  for (int32_t sy = 0; sy < src_height; ++sy) {
    for (int32_t sx = 0; sx < src_width; ++sx) {
      const int32_t dx = x + sx, dy = y + sy;
      if (dx < 0 || dx >= dst_width || dy < 0 || dy >= dst_height) continue;
      const uint8_t s = src[sy * src_width + sx];
      if (key <= 255 && s == key) continue;
      uint8_t &d = dst[dy * dst_width + dx];
      d = blend ? blended(d, s) : s;
    }
  }
}

// Source and destination inside one buffer, the destination before, on and after the source,
// with short and long distances and widths that differ: the row copy must still act as a
// left-to-right pixel copy.
TEST(Composite, OverlappingRastersMatchThePlainVisitingOrder) {
  struct OverlapCase {
    int32_t dst_offset, src_offset, dst_height, dst_width, src_height, src_width, x, y;
  };
  const OverlapCase kCases[] = {
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
  for (const OverlapCase &c : kCases) {
    // Values 0..7 make the key 3 dense; 0..255 leave long stretches without it; 2s and 4s hold
    // no 3 at first, but their blends are 3s written ahead of the pixels still to be read.
    for (int high : {7, 255, 4}) {
      for (uint16_t key : {uint16_t{256}, uint16_t{3}}) {
        for (bool blend : {false, true}) {
          SCOPED_TRACE(testing::Message()
                       << c.dst_offset << " " << c.src_offset << " x " << c.x << " y " << c.y
                       << " key " << key << " blend " << blend << " values up to " << high);
          Bytes expected = random_bytes(4096, 11, 0, high);
          if (high == 4) {
            for (uint8_t &v : expected) v = v < 3 ? 2 : 4;
          }
          Bytes actual = expected;
          reference_composite(blend, expected.data() + c.dst_offset, c.dst_height, c.dst_width,
                              expected.data() + c.src_offset, c.src_height, c.src_width, c.x, c.y,
                              key);
          (blend ? kel_image_blend_image : kel_image_draw_image)(
              actual.data() + c.dst_offset, c.dst_height, c.dst_width, actual.data() + c.src_offset,
              static_cast<uint16_t>(c.src_height), static_cast<uint16_t>(c.src_width), c.x, c.y,
              key);
          ASSERT_EQ(actual, expected);
        }
      }
    }
  }
}

// ---------------------------------------------------------------------------------------------
// Masked-region fill, with our default blur and enlargement
// ---------------------------------------------------------------------------------------------

struct Image {
  uint16_t height, width;
  Bytes pixels;
  uint8_t &at(int x, int y) { return pixels[static_cast<size_t>(y) * width + x]; }
  uint8_t at(int x, int y) const { return pixels[static_cast<size_t>(y) * width + x]; }
  bool interior(int x, int y) const {
    return x >= 1 && y >= 1 && x + 2 <= width && y + 2 <= height;
  }
};

bool has_neighbour(const Image &mask, int x, int y, bool want_hole) {
  for (int dy = -1; dy <= 1; ++dy) {
    for (int dx = -1; dx <= 1; ++dx) {
      const int nx = x + dx, ny = y + dy;
      if ((dx || dy) && nx >= 0 && ny >= 0 && nx < mask.width && ny < mask.height &&
          (mask.at(nx, ny) == 0) == want_hole) {
        return true;
      }
    }
  }
  return false;
}

Image fill(const Image &src, const Image &mask) {
  Image dst{src.height, src.width, Bytes(src.pixels.size(), 0xAA)};
  kel_mask_image(src.pixels.data(), src.height, src.width, mask.pixels.data(), dst.pixels.data());
  return dst;
}

// When every border pixel holds v, the grid fills with v wherever there is an edge and a
// constant grid stays constant through blur and enlargement: every hole pixel becomes v, and
// the seam then takes the blur of that picture.
Image expected_constant_fill(const Image &src, const Image &mask, uint8_t v) {
  Image filled = src;
  for (size_t i = 0; i < filled.pixels.size(); ++i) {
    if (mask.pixels[i] == 0) filled.pixels[i] = v;
  }
  Image blurred = filled;
  kel_blur_uint8(filled.pixels.data(), src.height, src.width, blurred.pixels.data());
  Image expected = filled;
  for (int y = 0; y < src.height; ++y) {
    for (int x = 0; x < src.width; ++x) {
      if (mask.at(x, y) == 0 && src.interior(x, y) && has_neighbour(mask, x, y, false)) {
        expected.at(x, y) = blurred.at(x, y);
      }
    }
  }
  return expected;
}

// Sets every interior known pixel next to the hole to `border`, every other known pixel next to
// it (edge rows and columns) to `edge`, and the rest to `inside`.
Image source_for(const Image &mask, uint8_t border, uint8_t edge, uint8_t inside) {
  Image src{mask.height, mask.width, Bytes(mask.pixels.size(), inside)};
  for (int y = 0; y < mask.height; ++y) {
    for (int x = 0; x < mask.width; ++x) {
      if (mask.at(x, y) != 0 && has_neighbour(mask, x, y, true)) {
        src.at(x, y) = mask.interior(x, y) ? border : edge;
      }
    }
  }
  return src;
}

Image mask_with_holes(uint16_t height, uint16_t width,
                      const std::vector<std::vector<int>> &rects /* x0, y0, x1, y1 */) {
  Image mask{height, width, Bytes(size_t{height} * width, 1)};
  for (const std::vector<int> &r : rects) {
    for (int y = r[1]; y <= r[3]; ++y) {
      for (int x = r[0]; x <= r[2]; ++x) mask.at(x, y) = 0;
    }
  }
  return mask;
}

TEST(MaskImage, NoHoleLeavesTheSource) {
  const Image src{37, 53, random_bytes(37 * 53, 3)};
  const Image mask{37, 53, random_bytes(37 * 53, 4, 1, 255)};
  EXPECT_EQ(fill(src, mask).pixels, src.pixels);
}

TEST(MaskImage, ConstantEdgeFillsTheHoleAndSoftensOnlyTheInteriorSeam) {
  struct HoleCase {
    const char *what;
    uint16_t height, width;
    std::vector<std::vector<int>> holes;
  };
  const HoleCase kCases[] = {
      {"one cell spreads to the whole grid", 64, 72, {{30, 30, 30, 30}}},
      {"hole in the first and last rows", 24, 16, {{3, 0, 7, 6}, {9, 17, 13, 23}}},
      {"hole in the first and last columns", 19, 21, {{0, 4, 5, 9}, {15, 10, 20, 14}}},
      {"sides not multiples of 8", 29, 35, {{10, 9, 27, 22}, {2, 2, 2, 2}}},
      {"everything but a ring", 40, 40, {{0, 0, 39, 9}, {0, 10, 9, 39}, {12, 12, 39, 39}}},
  };
  for (const HoleCase &c : kCases) {
    SCOPED_TRACE(c.what);
    const Image mask = mask_with_holes(c.height, c.width, c.holes);
    const Image src = source_for(mask, 60, 250, 200);
    const Image expected = expected_constant_fill(src, mask, 60);
    EXPECT_EQ(fill(src, mask).pixels, expected.pixels);
  }
}

TEST(MaskImage, EdgeRowHoleIsFilledButNotSoftened) {
  // The edge value 250 beside the hole in row 0 would show in a softened pixel there.
  const Image mask = mask_with_holes(24, 16, {{3, 0, 7, 6}});
  const Image src = source_for(mask, 60, 250, 200);
  const Image dst = fill(src, mask);
  EXPECT_EQ(dst.at(3, 0), 60);
  EXPECT_EQ(dst.at(7, 0), 60);
  EXPECT_NE(dst.at(3, 1), 60);  // the interior seam beneath it is softened
}

TEST(MaskImage, WithoutEdgeValuesTheHoleTakesTheEmptyGrid) {
  struct EmptyCase {
    uint16_t height, width;
    Bytes mask;
  };
  const EmptyCase kCases[] = {
      {5, 9, Bytes(45, 0)},                                // no known pixel at all
      {2, 7, {1, 0, 0, 1, 0, 1, 1, 0, 0, 0, 1, 0, 1, 1}},  // no interior pixels
      {9, 2, {0, 1, 1, 0, 0, 0, 1, 1, 0, 1, 0, 1, 1, 0, 0, 1, 1, 1}},
      {1, 1, {0}},
  };
  for (const EmptyCase &c : kCases) {
    SCOPED_TRACE(testing::Message() << c.height << " x " << c.width);
    const Image src{c.height, c.width, random_bytes(c.mask.size(), 5, 1, 255)};
    const Image dst = fill(src, Image{c.height, c.width, c.mask});
    for (size_t i = 0; i < c.mask.size(); ++i) {
      EXPECT_EQ(dst.pixels[i], c.mask[i] == 0 ? 0 : src.pixels[i]) << i;
    }
  }
}

TEST(MaskImage, InPlaceEqualsSeparateDestination) {
  for (uint16_t side : {uint16_t{3}, uint16_t{8}, uint16_t{37}, uint16_t{61}}) {
    const uint16_t width = static_cast<uint16_t>(side + 5);
    const Image src{side, width, random_bytes(size_t{side} * width, side)};
    const Image mask{side, width, random_bytes(size_t{side} * width, side + 1u, 0, 3)};
    Image in_place = src;
    kel_mask_image(in_place.pixels.data(), side, width, mask.pixels.data(), in_place.pixels.data());
    EXPECT_EQ(in_place.pixels, fill(src, mask).pixels) << side;
  }
}

TEST(MaskImage, ZeroSizesWriteNothing) {
  const Bytes src(8, 5), mask(8, 0);
  for (auto size : {std::pair<uint16_t, uint16_t>{0, 8}, {8, 0}, {0, 0}}) {
    Bytes dst(8, 0xAA);
    kel_mask_image(src.data(), size.first, size.second, mask.data(), dst.data());
    EXPECT_EQ(dst, Bytes(8, 0xAA));
  }
}

// ---------------------------------------------------------------------------------------------
// Our default blur and enlargement
// ---------------------------------------------------------------------------------------------

TEST(DefaultBlur, ImpulseGivesTheBinomialKernel) {
  Bytes impulse(25, 0);
  impulse[12] = 255;
  Bytes out(25, 0xAA);
  kel_blur_uint8(impulse.data(), 5, 5, out.data());
  const Bytes expected = {0,  0, 0, 0,  0,  0,  16, 32, 16, 0, 0, 32, 64,
                          32, 0, 0, 16, 32, 16, 0,  0,  0,  0, 0, 0};
  EXPECT_EQ(out, expected);
}

TEST(DefaultBlur, ConstantStaysAndInPlaceEqualsOutOfPlace) {
  // Widths around the 256-column strip, and single rows and columns.
  const std::pair<uint16_t, uint16_t> kSizes[] = {{1, 1},   {1, 300}, {300, 1}, {7, 255},
                                                  {7, 256}, {7, 257}, {5, 513}, {33, 600}};
  for (const auto &size : kSizes) {
    SCOPED_TRACE(testing::Message() << size.first << " x " << size.second);
    const size_t count = size_t{size.first} * size.second;
    Bytes constant(count, 93), out(count, 0);
    kel_blur_uint8(constant.data(), size.first, size.second, out.data());
    EXPECT_EQ(out, constant);

    const Bytes noise = random_bytes(count, size.second);
    kel_blur_uint8(noise.data(), size.first, size.second, out.data());
    Bytes in_place = noise;
    kel_blur_uint8(in_place.data(), size.first, size.second, in_place.data());
    EXPECT_EQ(in_place, out);
  }
  kel_blur_uint8(nullptr, 0, 5, nullptr);
  kel_blur_uint8(nullptr, 5, 0, nullptr);
}

TEST(DefaultScale, InterpolatesBetweenAlignedSampleCentres) {
  const Bytes ramp = {0, 255};
  Bytes out(8, 0xAA);
  kel_scale_up_bilinear_uint8(ramp.data(), 1, 2, 4, out.data(), 1, 8);
  EXPECT_EQ(out, (Bytes{0, 0, 32, 96, 159, 223, 255, 255}));
}

// The documented arithmetic, pixel by pixel: the centre of output pixel i lies at input
// position (2i + 1 - factor) / (2 factor), clamped to the first and last sample; the weight of
// the second sample is rounded down to 1/256; the total is rounded half up.
uint8_t documented_scale(const Bytes &in, int in_height, int in_width, int factor, int x, int y) {
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
  auto at = [&](int row, int col) {
    return uint32_t{in[static_cast<size_t>(row) * in_width + col]};
  };
  const uint32_t upper = at(r.first, c.first) * (256 - c.weight) + at(r.first, c.second) * c.weight;
  const uint32_t lower =
      at(r.second, c.first) * (256 - c.weight) + at(r.second, c.second) * c.weight;
  return static_cast<uint8_t>((upper * (256 - r.weight) + lower * r.weight + 32768) >> 16);
}

TEST(DefaultScale, EqualsTheDocumentedArithmetic) {
  struct ScaleCase {
    uint16_t in_height, in_width, factor, out_height, out_width;
  };
  const ScaleCase kCases[] = {{3, 4, 8, 24, 32},   {5, 300, 8, 40, 2400}, {7, 9, 3, 23, 29},
                              {4, 200, 1, 4, 200}, {6, 5, 2, 14, 13},     {2, 3, 5, 10, 15}};
  for (const ScaleCase &c : kCases) {
    SCOPED_TRACE(testing::Message() << c.in_height << " x " << c.in_width << " by " << c.factor);
    const Bytes in = random_bytes(size_t{c.in_height} * c.in_width, c.factor);
    Bytes out(size_t{c.out_height} * c.out_width);
    kel_scale_up_bilinear_uint8(in.data(), c.in_height, c.in_width, c.factor, out.data(),
                                c.out_height, c.out_width);
    for (int y = 0; y < c.out_height; ++y) {
      for (int x = 0; x < c.out_width; ++x) {
        ASSERT_EQ(out[static_cast<size_t>(y) * c.out_width + x],
                  documented_scale(in, c.in_height, c.in_width, c.factor, x, y))
            << x << ", " << y;
      }
    }
  }
}

TEST(DefaultScale, WritesEveryOutputPixel) {
  struct ScaleCase {
    uint16_t in_height, in_width, factor, out_height, out_width;
  };
  const ScaleCase kCases[] = {{3, 4, 8, 24, 32},     {3, 4, 8, 30, 40}, {1, 1, 8, 8, 8},
                              {5, 300, 8, 40, 2400}, {2, 2, 1, 9, 9},   {4, 4, 3, 5, 5},
                              {0, 4, 8, 3, 5},       {4, 0, 8, 3, 5},   {4, 4, 0, 3, 5}};
  for (const ScaleCase &c : kCases) {
    SCOPED_TRACE(testing::Message() << c.in_height << " x " << c.in_width << " by " << c.factor);
    const size_t in_count = size_t{c.in_height} * c.in_width;
    const size_t out_count = size_t{c.out_height} * c.out_width;
    const bool empty = in_count == 0 || c.factor == 0;
    const Bytes constant(in_count + 1, 71);
    Bytes low(out_count, 0), high(out_count, 255);
    kel_scale_up_bilinear_uint8(constant.data(), c.in_height, c.in_width, c.factor, low.data(),
                                c.out_height, c.out_width);
    kel_scale_up_bilinear_uint8(constant.data(), c.in_height, c.in_width, c.factor, high.data(),
                                c.out_height, c.out_width);
    EXPECT_EQ(low, Bytes(out_count, empty ? 0 : 71));
    EXPECT_EQ(high, low);

    const Bytes noise = random_bytes(in_count + 1, c.in_width);
    std::fill(low.begin(), low.end(), 0);
    std::fill(high.begin(), high.end(), 255);
    kel_scale_up_bilinear_uint8(noise.data(), c.in_height, c.in_width, c.factor, low.data(),
                                c.out_height, c.out_width);
    kel_scale_up_bilinear_uint8(noise.data(), c.in_height, c.in_width, c.factor, high.data(),
                                c.out_height, c.out_width);
    EXPECT_EQ(high, low);
  }
  kel_scale_up_bilinear_uint8(nullptr, 0, 0, 8, nullptr, 0, 0);
}

}  // namespace
