// The masked fill's faster loops against the plain ones they replaced, bit for bit: our
// enlargement against a per-pixel model, on random rasters of odd sizes, every small factor,
// outputs larger and smaller than input * factor, and the extreme values.
#include <gtest/gtest.h>

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <random>
#include <utility>
#include <vector>

#include "kel_images.h"
#include "kel_outside.h"

namespace {

using Bytes = std::vector<uint8_t>;

// The plain enlargement, one output pixel at a time: the aligned sample position and its 8-bit
// weights, the four products summed in 32 bits and rounded half up.
struct ModelTap {
  uint32_t first, second, weight_second;
};

ModelTap model_locate(uint32_t out_index, uint32_t factor, uint32_t in_size) {
  const int64_t scaled = 2 * int64_t{out_index} + 1 - int64_t{factor};
  const int64_t span = 2 * int64_t{factor};
  const uint32_t last = in_size - 1;
  if (scaled <= 0) return {0, 0, 0};
  const int64_t first = scaled / span;
  if (first >= last) return {last, last, 0};
  const int64_t fraction = scaled - first * span;
  return {static_cast<uint32_t>(first), static_cast<uint32_t>(first + 1),
          static_cast<uint32_t>((fraction << 8) / span)};
}

Bytes model_scale_up(const Bytes &in, uint32_t in_height, uint32_t in_width, uint32_t factor,
                     uint32_t out_height, uint32_t out_width) {
  Bytes out(size_t{out_height} * out_width, 0);
  if (in_height == 0 || in_width == 0 || factor == 0) return out;
  for (uint32_t y = 0; y < out_height; ++y) {
    const ModelTap row = model_locate(y, factor, in_height);
    for (uint32_t x = 0; x < out_width; ++x) {
      const ModelTap col = model_locate(x, factor, in_width);
      auto at = [&](uint32_t r, uint32_t c) { return uint32_t{in[size_t{r} * in_width + c]}; };
      const uint32_t top = at(row.first, col.first) * (256 - col.weight_second) +
                           at(row.first, col.second) * col.weight_second;
      const uint32_t bottom = at(row.second, col.first) * (256 - col.weight_second) +
                              at(row.second, col.second) * col.weight_second;
      const uint32_t total = top * (256 - row.weight_second) + bottom * row.weight_second;
      out[size_t{y} * out_width + x] = static_cast<uint8_t>((total + 32768u) >> 16);
    }
  }
  return out;
}

TEST(FillSpeedParity, EnlargementMatchesThePerPixelModel) {
  std::mt19937 rng(23);
  std::uniform_int_distribution<uint32_t> side(1, 40), factor_of(0, 20), extra(0, 9);
  for (int round = 0; round < 300; ++round) {
    const uint32_t in_height = side(rng), in_width = round == 0 ? 300 : side(rng);
    const uint32_t factor = round < 21 ? static_cast<uint32_t>(round) : factor_of(rng);
    // Outputs at, above and below input * factor; the first wide one spans several strips.
    const uint32_t tall = in_height * (factor ? factor : 1);
    const uint32_t out_height = (round % 2 ? tall / 2 : tall) + extra(rng);
    const uint32_t out_width = in_width * (factor ? factor : 1) + extra(rng);
    Bytes in(size_t{in_height} * in_width);
    for (uint8_t &p : in) {
      const uint32_t pick = rng() % 4;
      p = pick == 0 ? 0 : pick == 1 ? 255 : static_cast<uint8_t>(rng());
    }
    Bytes out(size_t{out_height} * out_width, 0xAA);
    kel_scale_up_bilinear_uint8(in.data(), static_cast<uint16_t>(in_height),
                                static_cast<uint16_t>(in_width), static_cast<uint16_t>(factor),
                                out.data(), static_cast<uint16_t>(out_height),
                                static_cast<uint16_t>(out_width));
    ASSERT_EQ(out, model_scale_up(in, in_height, in_width, factor, out_height, out_width))
        << in_height << " x " << in_width << " by " << factor << " to " << out_height << " x "
        << out_width;
  }
}

// The fill one pixel at a time, as plainly as it reads: neighbours tested one by one, one cell
// update per border pixel, one dilation pass per loop.
Bytes model_fill(const Bytes &src, size_t height, size_t width, const Bytes &mask) {
  const size_t grid_h = (height + 7) / 8, grid_w = (width + 7) / 8;
  Bytes dst = src, current(grid_h * grid_w, 0), enlarged(grid_h * 8 * grid_w * 8);
  Bytes blurred(height * width);
  auto window_has = [&](size_t x, size_t y, bool want_hole) {
    for (size_t dy = 0; dy < 3; ++dy)
      for (size_t dx = 0; dx < 3; ++dx)
        if ((dx != 1 || dy != 1) && (mask[(y + dy - 1) * width + x + dx - 1] == 0) == want_hole)
          return true;
    return false;
  };
  for (size_t y = 1; y + 1 < height; ++y)
    for (size_t x = 1; x + 1 < width; ++x)
      if (mask[y * width + x] != 0 && window_has(x, y, true)) {
        uint8_t &cell = current[(y / 8) * grid_w + x / 8];
        if (cell < src[y * width + x]) cell = src[y * width + x];
      }
  for (bool filled = true; filled;) {
    filled = false;
    Bytes next = current;
    for (size_t cy = 0; cy < grid_h; ++cy)
      for (size_t cx = 0; cx < grid_w; ++cx) {
        if (current[cy * grid_w + cx] != 0) continue;
        uint8_t best = 0;
        for (size_t ny = cy ? cy - 1 : 0; ny <= cy + 1 && ny < grid_h; ++ny)
          for (size_t nx = cx ? cx - 1 : 0; nx <= cx + 1 && nx < grid_w; ++nx)
            best = std::max(best, current[ny * grid_w + nx]);
        if (best != 0) next[cy * grid_w + cx] = best, filled = true;
      }
    current = next;
  }
  const auto gh = static_cast<uint16_t>(grid_h), gw = static_cast<uint16_t>(grid_w);
  kel_blur_uint8(current.data(), gh, gw, current.data());
  kel_scale_up_bilinear_uint8(current.data(), gh, gw, 8, enlarged.data(),
                              static_cast<uint16_t>(gh * 8), static_cast<uint16_t>(gw * 8));
  for (size_t y = 0; y < height; ++y)
    for (size_t x = 0; x < width; ++x)
      if (mask[y * width + x] == 0) dst[y * width + x] = enlarged[y * grid_w * 8 + x];
  const Bytes filled_image = dst;
  kel_blur_uint8(filled_image.data(), static_cast<uint16_t>(height), static_cast<uint16_t>(width),
                 blurred.data());
  for (size_t y = 1; y + 1 < height; ++y)
    for (size_t x = 1; x + 1 < width; ++x)
      if (mask[y * width + x] == 0 && window_has(x, y, false))
        dst[y * width + x] = blurred[y * width + x];
  return dst;
}

// Random blobs, scattered holes and stripes, on sizes around the vector widths and the
// 256-column pieces, with 0 and 255 among the source values and mask values other than 1.
TEST(FillSpeedParity, FillMatchesThePerPixelModel) {
  std::mt19937 rng(5);
  const std::pair<size_t, size_t> sizes[] = {{1, 1},   {2, 9},    {3, 3},    {9, 2},   {17, 33},
                                             {40, 31}, {13, 257}, {21, 300}, {64, 515}};
  for (const auto &[height, width] : sizes) {
    for (int pattern = 0; pattern < 4; ++pattern) {
      Bytes src(height * width), mask(height * width, 1);
      for (uint8_t &p : src)
        p = rng() % 5 == 0 ? static_cast<uint8_t>((rng() % 2) * 255) : static_cast<uint8_t>(rng());
      for (size_t i = 0; i < mask.size(); ++i) {
        const size_t x = i % width, y = i / width;
        const bool hole = pattern == 0   ? rng() % 7 == 0
                          : pattern == 1 ? (x / 5 + y / 3) % 4 == 0
                          : pattern == 2 ? (x - width / 3) * (x - width / 3) +
                                                   (y - height / 2) * (y - height / 2) <
                                               width * 2
                                         : false;
        mask[i] = hole ? 0 : static_cast<uint8_t>(1 + rng() % 255);
      }
      Bytes dst(src.size(), 0x5A), in_place = src;
      kel_mask_image(src.data(), static_cast<uint16_t>(height), static_cast<uint16_t>(width),
                     mask.data(), dst.data());
      kel_mask_image(in_place.data(), static_cast<uint16_t>(height), static_cast<uint16_t>(width),
                     mask.data(), in_place.data());
      const Bytes expected = model_fill(src, height, width, mask);
      ASSERT_EQ(dst, expected) << height << " x " << width << ", pattern " << pattern;
      ASSERT_EQ(in_place, expected) << height << " x " << width << ", pattern " << pattern;
    }
  }
}

}  // namespace
