// Helpers shared by the test programs: seeded random rasters, rasters with guard bytes, rasters
// as rows of characters, the pixel classes of the masked fill, and a run of every vector variant.
#pragma once

#include <gtest/gtest.h>

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <random>
#include <string>
#include <vector>

#if KEL_USE_HIGHWAY
#include <hwy/targets.h>
#endif

namespace kel_test {

using Bytes = std::vector<uint8_t>;
using Rows = std::vector<std::string>;

// `count` values drawn uniformly from low..high; the same seed gives the same bytes.
inline Bytes random_bytes(size_t count, uint32_t seed, int low = 0, int high = 255) {
  std::mt19937 generator(seed);
  std::uniform_int_distribution<int> value(low, high);
  Bytes bytes(count);
  for (uint8_t &b : bytes) b = static_cast<uint8_t>(value(generator));
  return bytes;
}

// A raster of `count` bytes with guard bytes on both sides, which no call may touch.
struct Guarded {
  static constexpr size_t kGuard = 64;
  static constexpr uint8_t kGuardByte = 0xA5;
  Bytes bytes;
  Guarded(size_t count, uint8_t fill) : bytes(count + 2 * kGuard, fill) {
    std::fill(bytes.begin(), bytes.begin() + kGuard, kGuardByte);
    std::fill(bytes.end() - kGuard, bytes.end(), kGuardByte);
  }
  uint8_t *data() { return bytes.data() + kGuard; }
  const uint8_t *data() const { return bytes.data() + kGuard; }
  Bytes inside() const { return Bytes(bytes.begin() + kGuard, bytes.end() - kGuard); }
  bool guards_intact() const {
    for (size_t i = 0; i < kGuard; ++i) {
      if (bytes[i] != kGuardByte || bytes[bytes.size() - 1 - i] != kGuardByte) return false;
    }
    return true;
  }
};

// A raster as rows of characters, one per pixel, to compare with a picture.
inline Rows to_rows(const uint8_t *pixels, int32_t height, int32_t width) {
  Rows rows;
  for (int32_t y = 0; y < height; ++y) {
    rows.emplace_back(pixels + static_cast<size_t>(y) * static_cast<size_t>(width),
                      pixels + static_cast<size_t>(y + 1) * static_cast<size_t>(width));
  }
  return rows;
}

// The pixel classes of the masked fill: a hole has mask 0; interior pixels are off the first and
// last rows and columns; border and seam pixels are interior pixels with a neighbour of the
// other kind.
struct Mask {
  int height, width;
  const uint8_t *values;
  bool hole(int x, int y) const { return values[static_cast<size_t>(y) * width + x] == 0; }
  bool interior(int x, int y) const {
    return x >= 1 && y >= 1 && x + 2 <= width && y + 2 <= height;
  }
  bool next_to(int x, int y, bool want_hole) const {
    for (int dy = -1; dy <= 1; ++dy) {
      for (int dx = -1; dx <= 1; ++dx) {
        const int nx = x + dx, ny = y + dy;
        if ((dx || dy) && nx >= 0 && ny >= 0 && nx < width && ny < height &&
            hole(nx, ny) == want_hole) {
          return true;
        }
      }
    }
    return false;
  }
  bool border(int x, int y) const { return !hole(x, y) && interior(x, y) && next_to(x, y, true); }
  bool seam(int x, int y) const { return hole(x, y) && interior(x, y) && next_to(x, y, false); }
};

// Runs `check` once for every vector variant compiled in that this machine runs, each forced in
// turn. A build with Highway's headers alone has one variant, the baseline's, which the library
// calls directly; without Highway the plain loops run, once.
template <typename Check>
void for_each_variant(Check check) {
#if KEL_USE_HIGHWAY && !defined(HWY_COMPILE_ONLY_STATIC)
  for (const int64_t target : hwy::SupportedAndGeneratedTargets()) {
    SCOPED_TRACE(hwy::TargetName(target));
    hwy::SetSupportedTargetsForTest(target);
    check();
  }
  hwy::SetSupportedTargetsForTest(0);
#else
#if KEL_USE_HIGHWAY
  SCOPED_TRACE(hwy::TargetName(HWY_STATIC_TARGET));
#endif
  check();
#endif
}

}  // namespace kel_test
