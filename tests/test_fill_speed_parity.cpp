// The masked fill's faster loops against a plain per-pixel model of the fill, bit for bit. (Our
// enlargement has its own check against the documented arithmetic in test_pixel_ops.)
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

// Random blobs, scattered holes and stripes, on sizes around the vector widths, the 256-column
// pieces and the 256-cell dilation strips, with 0 and 255 among the source values and mask
// values other than 1.
TEST(FillSpeedParity, FillMatchesThePerPixelModel) {
  std::mt19937 rng(5);
  const std::pair<size_t, size_t> sizes[] = {{1, 1},   {2, 9},    {3, 3},    {9, 2},    {17, 33},
                                             {40, 31}, {13, 257}, {21, 300}, {64, 515}, {26, 2100}};
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
