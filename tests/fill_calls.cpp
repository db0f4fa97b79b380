// The masked fill's calls to its two sibling functions, seen through recording stand-ins. This
// program links the library proper only, so the stand-ins below are the functions it calls.
#include <gtest/gtest.h>

#include <algorithm>
#include <cstdint>
#include <cstdlib>
#include <random>
#include <utility>
#include <vector>

#include "kel_images.h"
#include "kel_outside.h"
#include "test_support.h"

namespace {

using Bytes = std::vector<uint8_t>;

struct Call {
  bool is_blur;
  const uint8_t *in;
  uint16_t in_height, in_width;
  uint8_t *out;
  uint16_t factor, out_height, out_width;  // enlargement only
  Bytes input;                             // what `in` held at the call
};

std::vector<Call> g_calls;

// What the stand-ins write, easy to tell apart: the blur inverts, the enlargement writes a
// pattern of the output offset.
uint8_t blur_result(uint8_t value) {
  return static_cast<uint8_t>(255 - value);
}
uint8_t enlarged_at(size_t offset) {
  return static_cast<uint8_t>(offset * 13 + 7);
}

}  // namespace

extern "C" {

void kel_blur_uint8(const uint8_t *in, uint16_t height, uint16_t width, uint8_t *out) {
  const size_t count = size_t{height} * width;
  g_calls.push_back({true, in, height, width, out, 0, 0, 0, Bytes(in, in + count)});
  for (size_t i = 0; i < count; ++i) out[i] = blur_result(in[i]);
}

void kel_scale_up_bilinear_uint8(const uint8_t *in, uint16_t in_height, uint16_t in_width,
                                 uint16_t factor, uint8_t *out, uint16_t out_height,
                                 uint16_t out_width) {
  const size_t count = size_t{in_height} * in_width;
  g_calls.push_back(
      {false, in, in_height, in_width, out, factor, out_height, out_width, Bytes(in, in + count)});
  for (size_t i = 0; i < size_t{out_height} * out_width; ++i) out[i] = enlarged_at(i);
}

// The library proper also calls the math functions; they must exist for a shared build to link.
int32_t tq_cos_(uint8_t) {
  return 16384;
}
int32_t tq_sin_(uint8_t) {
  return 0;
}
uint32_t tq_sqrt_24_5(uint32_t) {
  return 0;
}

}  // extern "C"

namespace {

using kel_test::Guarded;

struct Picture {
  uint16_t height, width;
  Bytes src, mask;
  kel_test::Mask classes() const { return {height, width, mask.data()}; }
  uint16_t grid_height() const { return static_cast<uint16_t>((height + 7) / 8); }
  uint16_t grid_width() const { return static_cast<uint16_t>((width + 7) / 8); }
};

// Runs the fill into a separate, guarded destination and returns the grid that its first call,
// the grid's blur, received.
Bytes grid_reaching_blur(const Picture &p) {
  Guarded dst(p.src.size(), 0xEE);
  g_calls.clear();
  kel_mask_image(p.src.data(), p.height, p.width, p.mask.data(), dst.data());
  EXPECT_TRUE(dst.guards_intact());
  if (g_calls.size() != 3) ADD_FAILURE() << g_calls.size() << " calls";
  return g_calls.empty() ? Bytes() : g_calls[0].input;
}

// Per cell, the largest source value among the border pixels, then every empty cell takes the
// largest value among the filled cells nearest to it (Chebyshev distance): that is what passes
// of one ring each produce.
Bytes expected_grid(const Picture &p) {
  const int grid_height = p.grid_height(), grid_width = p.grid_width();
  Bytes gathered(static_cast<size_t>(grid_height) * grid_width, 0);
  for (int y = 0; y < p.height; ++y) {
    for (int x = 0; x < p.width; ++x) {
      if (p.classes().border(x, y)) {
        uint8_t &cell = gathered[static_cast<size_t>(y / 8) * grid_width + x / 8];
        cell = std::max(cell, p.src[static_cast<size_t>(y) * p.width + x]);
      }
    }
  }
  Bytes grid = gathered;
  for (int cy = 0; cy < grid_height; ++cy) {
    for (int cx = 0; cx < grid_width; ++cx) {
      int nearest = INT32_MAX;
      uint8_t value = 0;
      for (int sy = 0; sy < grid_height; ++sy) {
        for (int sx = 0; sx < grid_width; ++sx) {
          const uint8_t seed = gathered[static_cast<size_t>(sy) * grid_width + sx];
          const int distance = std::max(std::abs(sx - cx), std::abs(sy - cy));
          if (seed == 0 || distance > nearest) continue;
          value = distance < nearest ? seed : std::max(value, seed);
          nearest = distance;
        }
      }
      grid[static_cast<size_t>(cy) * grid_width + cx] = value;
    }
  }
  return grid;
}

// A fifth of the pixels holes, the rest known with any nonzero mask value.
Picture random_picture(uint16_t height, uint16_t width, uint32_t seed) {
  const size_t count = size_t{height} * width;
  Picture p{height, width, kel_test::random_bytes(count, seed),
            kel_test::random_bytes(count, seed + 1000, 0, 4)};
  const Bytes known = kel_test::random_bytes(count, seed + 2000, 1, 255);
  for (size_t i = 0; i < count; ++i) p.mask[i] = p.mask[i] == 0 ? 0 : known[i];
  return p;
}

Picture blank_picture(uint16_t height, uint16_t width) {
  return Picture{height, width, Bytes(size_t{height} * width, 0), Bytes(size_t{height} * width, 1)};
}

// One hole pixel at (x, y) whose eight neighbours, its only border pixels, hold `value`.
void seed_cell(Picture &p, int x, int y, uint8_t value) {
  p.mask[static_cast<size_t>(y) * p.width + x] = 0;
  for (int dy = -1; dy <= 1; ++dy) {
    for (int dx = -1; dx <= 1; ++dx) {
      if (dx || dy) p.src[static_cast<size_t>(y + dy) * p.width + x + dx] = value;
    }
  }
}

// The three calls and what is done with their results, in place and into a separate
// destination: the gathered and dilated grid is smoothed in place, enlarged by 8 into its own
// raster; holes take the enlarged raster, the filled image is blurred into a third raster, and
// the interior seam takes that. Sizes without interior pixels gather nothing and soften nothing;
// zero sizes still make all three calls and write nothing; without a hole the source is kept.
TEST(FillCalls, ArgumentsOrderAndWhatIsDoneWithTheResults) {
  const uint16_t kSizes[][2] = {{20, 27}, {2, 7}, {9, 2}, {1, 1},
                                {0, 5},   {5, 0}, {0, 0}, {0, 65528}};
  for (const auto &size : kSizes) {
    for (int variant = 0; variant < 4; ++variant) {
      const bool in_place = variant % 2, no_hole = variant / 2;
      SCOPED_TRACE(testing::Message()
                   << size[0] << " x " << size[1] << (in_place ? " in place" : "")
                   << (no_hole ? " without a hole" : ""));
      Picture p = random_picture(size[0], size[1], size[0] + 1u);
      if (no_hole) std::replace(p.mask.begin(), p.mask.end(), uint8_t{0}, uint8_t{1});
      const kel_test::Mask mask = p.classes();
      Guarded src(p.src.size(), 0), dst(p.src.size(), 0xEE);
      std::copy(p.src.begin(), p.src.end(), src.data());
      if (in_place) std::copy(p.src.begin(), p.src.end(), dst.data());
      g_calls.clear();
      kel_mask_image(in_place ? dst.data() : src.data(), p.height, p.width, p.mask.data(),
                     dst.data());
      EXPECT_TRUE(dst.guards_intact());
      ASSERT_EQ(g_calls.size(), 3u);
      const Call &grid_blur = g_calls[0], &enlarge = g_calls[1], &image_blur = g_calls[2];
      const uint16_t grid_height = p.grid_height(), grid_width = p.grid_width();
      EXPECT_TRUE(grid_blur.is_blur && !enlarge.is_blur && image_blur.is_blur);
      EXPECT_EQ(grid_blur.in, grid_blur.out);
      EXPECT_EQ(enlarge.in, grid_blur.out);
      EXPECT_EQ(image_blur.in, dst.data());
      const std::vector<uint16_t> sizes = {
          grid_blur.in_height, grid_blur.in_width,   enlarge.in_height,
          enlarge.in_width,    enlarge.factor,       enlarge.out_height,
          enlarge.out_width,   image_blur.in_height, image_blur.in_width};
      EXPECT_EQ(sizes, (std::vector<uint16_t>{grid_height, grid_width, grid_height, grid_width, 8,
                                              uint16_t(grid_height * 8), uint16_t(grid_width * 8),
                                              p.height, p.width}));
      for (const uint8_t *out : {enlarge.out, grid_blur.out}) EXPECT_NE(image_blur.out, out);
      EXPECT_NE(enlarge.out, grid_blur.out);
      EXPECT_EQ(grid_blur.input, expected_grid(p));
      Bytes smoothed = grid_blur.input;
      for (uint8_t &v : smoothed) v = blur_result(v);
      EXPECT_EQ(enlarge.input, smoothed);
      for (int i = 0; i < int(p.src.size()); ++i) {
        const int x = i % p.width, y = i / p.width;
        const uint8_t filled =
            mask.hole(x, y) ? enlarged_at(size_t(y) * enlarge.out_width + x) : p.src[i];
        ASSERT_EQ(image_blur.input[i], filled) << x << ", " << y;
        ASSERT_EQ(dst.data()[i], mask.seam(x, y) ? blur_result(filled) : filled) << x << ", " << y;
      }
    }
  }
}

TEST(FillCalls, SidesBeyondTheEnlargedRangeReturnAtOnce) {
  for (auto size : {std::pair<uint16_t, uint16_t>{65529, 1}, {1, 65529}, {65535, 1}}) {
    const Bytes src(65535, 9), mask(65535, 0);
    Bytes dst(65535, 0xEE);
    g_calls.clear();
    kel_mask_image(src.data(), size.first, size.second, mask.data(), dst.data());
    EXPECT_TRUE(g_calls.empty());
    EXPECT_EQ(dst, Bytes(65535, 0xEE));
  }
}

// The grid that reaches the first blur: gathered maxima, then one ring per dilation pass.
TEST(FillCalls, GridIsGatheredAndDilated) {
  struct Seed {
    int x, y;
    uint8_t value;
  };
  const struct {
    const char *what;
    uint16_t height, width;
    std::vector<Seed> seeds;
    Bytes grid;  // empty: the grid is checked against expected_grid only
  } kCases[] = {
      {"one cell at a corner fills the whole grid", 40, 56, {{3, 3, 90}}, Bytes(35, 90)},
      {"one cell in the middle", 40, 56, {{27, 19, 90}}, Bytes(35, 90)},
      {"one cell at the far corner", 40, 56, {{52, 36, 90}}, Bytes(35, 90)},
      {"equal distance takes the larger", 8, 24, {{3, 3, 30}, {19, 3, 70}}, {30, 70, 70}},
      {"the nearer value wins", 8, 32, {{3, 3, 30}, {27, 3, 70}}, {30, 30, 70, 70}},
      {"nearer smaller value wins", 8, 40, {{3, 3, 70}, {35, 3, 30}}, {70, 70, 70, 30, 30}},
      {"two fronts meeting", 48, 64, {{11, 11, 200}, {52, 36, 40}}, {}},
      {"several values in one cell: the largest", 16, 16, {{3, 3, 10}, {4, 5, 99}}, Bytes(4, 99)},
      {"border pixels of value 0 mark nothing", 16, 24, {{3, 3, 0}, {19, 11, 55}}, Bytes(6, 55)},
      {"last cells cover fewer pixels", 19, 21, {{18, 3, 80}, {3, 17, 20}}, {}},
      {"one column of cells", 40, 8, {{3, 19, 66}}, Bytes(5, 66)},
      {"one row of cells", 8, 40, {{19, 3, 66}}, Bytes(5, 66)},
      {"a grid wider than one strip",
       24,
       2100,
       {{3, 3, 10}, {900, 12, 200}, {2060, 19, 120}, {2090, 3, 250}},
       {}},
      {"a tall grid", 2100, 24, {{12, 3, 90}, {3, 1000, 30}, {20, 2090, 140}}, {}},
  };
  for (const auto &c : kCases) {
    SCOPED_TRACE(c.what);
    Picture p = blank_picture(c.height, c.width);
    for (const Seed &s : c.seeds) seed_cell(p, s.x, s.y, s.value);
    const Bytes grid = grid_reaching_blur(p);
    if (!c.grid.empty()) {
      EXPECT_EQ(grid, c.grid);
    }
    EXPECT_EQ(grid, expected_grid(p));
  }
  // A hole right beside an edge of the column pieces in which the edge walker looks for holes,
  // its only higher border pixels on the other side of that edge.
  for (int x : {64, 65, 128, 129, 192, 193}) {
    Picture p = blank_picture(16, 200);
    std::fill(p.src.begin(), p.src.end(), 10);
    p.mask[size_t{8} * p.width + x] = 0;
    for (int y = 7; y <= 9; ++y)
      p.src[static_cast<size_t>(y) * p.width + (x % 2 ? x - 1 : x + 1)] = 77;
    EXPECT_EQ(grid_reaching_blur(p), expected_grid(p)) << "piece edge at " << x;
  }
  for (uint32_t seed = 0; seed < 8; ++seed) {
    const Picture p = random_picture(uint16_t(17 + seed * 5), uint16_t(40 - seed * 3), seed);
    EXPECT_EQ(grid_reaching_blur(p), expected_grid(p)) << "random " << seed;
  }
  // A few cells far apart on wide and tall grids, their values from a short list so that fronts
  // of different values meet at equal distances all over the grid.
  std::mt19937 rng(3);
  for (int trial = 0; trial < 40; ++trial) {
    const auto height = static_cast<uint16_t>(8 + rng() % 300);
    const auto width = static_cast<uint16_t>(8 + rng() % 300);
    Picture p = blank_picture(height, width);
    for (int seeds = 1 + static_cast<int>(rng() % 6); seeds > 0; --seeds) {
      seed_cell(p, 3 + static_cast<int>(rng() % (width - 6u)),
                3 + static_cast<int>(rng() % (height - 6u)),
                static_cast<uint8_t>(40 * (1 + rng() % 3)));
    }
    EXPECT_EQ(grid_reaching_blur(p), expected_grid(p)) << "sparse " << trial;
  }
}

}  // namespace
