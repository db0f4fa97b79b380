#include <gtest/gtest.h>

#include <algorithm>
#include <climits>
#include <cmath>
#include <cstdint>
#include <random>
#include <tuple>
#include <vector>

#include "kel_images.h"

namespace {

constexpr uint32_t kUntouched = 0xDEADBEEF;

// The one-increment-per-pixel count that the laned histogram must reproduce.
std::vector<uint32_t> plain_histogram(const std::vector<uint8_t> &pixels, uint32_t bits) {
  std::vector<uint32_t> hist(size_t{1} << bits, 0);
  for (uint8_t p : pixels) ++hist[p >> (8 - bits)];
  return hist;
}

// Bins followed by the untouched bin that must survive behind them.
std::vector<uint32_t> then_untouched(std::vector<uint32_t> bins) {
  bins.push_back(kUntouched);
  return bins;
}

std::vector<uint8_t> halves(size_t count) {
  std::vector<uint8_t> pixels(count, 0);
  for (size_t i = count / 2; i < count; ++i) pixels[i] = 255;
  return pixels;
}

using Stats = std::tuple<int, int, int>;  // mean, variance, standard deviation

// Every route to the statistics of one image: through a histogram, and straight from the
// image with and without mean_out. All must agree before one result is returned.
Stats image_stats(const uint8_t *src, int32_t height, int32_t width) {
  uint32_t hist[256];
  kel_image_histogram(src, height, width, hist);
  const uint32_t count = static_cast<uint32_t>(height) * static_cast<uint32_t>(width);
  const uint8_t mean = kel_hist_mean(hist, count);
  const Stats from_hist{mean, kel_hist_var(hist, mean, count), kel_hist_std(hist, mean, count)};
  uint8_t var_mean = 0xAA, std_mean = 0x55;
  const uint16_t var = kel_image_var(src, height, width, &var_mean);
  const uint8_t std = kel_image_std(src, height, width, &std_mean);
  EXPECT_EQ(Stats(var_mean, var, std), from_hist);
  EXPECT_EQ(std_mean, var_mean);
  EXPECT_EQ(kel_image_var(src, height, width, nullptr), var);
  EXPECT_EQ(kel_image_std(src, height, width, nullptr), std);
  return from_hist;
}

struct StatsCase {
  int32_t height, width;
  std::vector<uint8_t> pixels;
  Stats expected;
};

const StatsCase kStatsCases[] = {
    {1, 1, {0}, {0, 0, 0}},
    {1, 1, {93}, {93, 0, 0}},
    {1, 1, {255}, {255, 0, 0}},
    {3, 5, std::vector<uint8_t>(15, 200), {200, 0, 0}},
    {1, 2, {0, 1}, {0, 0, 0}},               // 0.5 truncated, both times
    {3, 1, {0, 2, 2}, {1, 1, 1}},            // about the truncated mean 1, not 4/3
    {2, 1, {0, 3}, {1, 2, 1}},               // (1 + 4) / 2 truncated
    {4, 4, halves(16), {127, 16256, 127}},   // (127^2 + 128^2) / 2, the largest variance
    {1, 4, {10, 10, 10, 14}, {11, 3, 1}},    // (1 + 1 + 1 + 9) / 4
    {2, 3, {0, 9, 9, 9, 9, 9}, {7, 11, 3}},  // 45 / 6 = 7; (49 + 5 * 4) / 6 = 11
    // Beyond 264191 extreme pixels the variance sum wraps: 300000 * (127^2 + 128^2) mod 2^32
    // = 1163965408, over 600000 pixels.
    {600, 1000, halves(600000), {127, 1939, 44}},
};

TEST(Statistics, Examples) {
  for (const StatsCase &c : kStatsCases) {
    SCOPED_TRACE(testing::Message() << c.height << "x" << c.width);
    EXPECT_EQ(image_stats(c.pixels.data(), c.height, c.width), c.expected);
  }
}

TEST(Statistics, MatchADirectComputationOnRandomImages) {
  std::mt19937 rng(7);
  const int32_t sizes[][2] = {{1, 3}, {3, 5}, {7, 13}, {31, 33}, {127, 129}, {255, 3}};
  for (const auto &size : sizes) {
    std::vector<uint8_t> pixels(size_t(size[0]) * size_t(size[1]));
    const uint32_t spread = 1 + rng() % 256;  // narrow and wide intensity ranges
    for (uint8_t &p : pixels) p = static_cast<uint8_t>(rng() % spread);
    uint64_t sum = 0, squares = 0;
    for (uint8_t p : pixels) sum += p;
    const int64_t mean = static_cast<int64_t>(sum / pixels.size());
    for (uint8_t p : pixels) squares += static_cast<uint64_t>((p - mean) * (p - mean));
    const uint64_t var = squares / pixels.size();
    const Stats direct{int(mean), int(var), int(std::sqrt(double(var)))};
    EXPECT_EQ(image_stats(pixels.data(), size[0], size[1]), direct) << size[0] << "x" << size[1];
  }
}

// Sums wrap modulo 2^32 and only the low bits of each quotient are returned, also when the
// count passed is smaller than the histogram's total.
TEST(Statistics, QuotientsKeepTheirLowBits) {
  std::vector<uint32_t> hist(256, 0);
  hist[255] = 4;
  EXPECT_EQ(kel_hist_mean(hist.data(), 1), 252);      // 1020
  EXPECT_EQ(kel_hist_var(hist.data(), 0, 1), 63492);  // 4 * 255^2 = 260100
  // 63492 << 18 loses its top bits: the root is taken of 14340 << 18.
  EXPECT_EQ(kel_hist_std(hist.data(), 0, 1), 119);
  hist[255] = 16843010;  // 255 * 16843010 = 2^32 + 254
  EXPECT_EQ(kel_hist_mean(hist.data(), 1), 254);
}

// No pixels: the histogram is cleared, nothing is read (src is null here) and every statistic
// is 0 instead of a division by zero. Negative products, wrapped as 32-bit, count nothing too.
TEST(Statistics, EmptyImagesAndZeroCounts) {
  const int32_t sizes[][2] = {
      {0, 0},         {0, 5},         {5, 0},          {-1, 5},
      {INT32_MIN, 1}, {65536, 65536}, {-65536, 32768}, {INT32_MIN, INT32_MIN}};
  for (const auto &size : sizes) {
    SCOPED_TRACE(testing::Message() << size[0] << "x" << size[1]);
    std::vector<uint32_t> hist(256, kUntouched);
    kel_image_histogram(nullptr, size[0], size[1], hist.data());
    EXPECT_EQ(hist, std::vector<uint32_t>(256, 0));
    hist.assign(17, kUntouched);
    kel_image_histogram_n(nullptr, size[0], size[1], 4, hist.data());
    EXPECT_EQ(hist, then_untouched(std::vector<uint32_t>(16, 0)));
    EXPECT_EQ(image_stats(nullptr, size[0], size[1]), (Stats{0, 0, 0}));
  }
  const std::vector<uint32_t> hist(256, 3);
  EXPECT_EQ(kel_hist_mean(hist.data(), 0), 0);
  EXPECT_EQ(kel_hist_var(hist.data(), 9, 0), 0);
  EXPECT_EQ(kel_hist_std(hist.data(), 9, 0), 0);
}

struct ReducedCase {
  uint32_t bits;
  std::vector<uint8_t> pixels;
  std::vector<uint32_t> bins;  // all 2^bits bins; the next one must survive
};

const ReducedCase kReducedCases[] = {
    {4, {15, 16, 255, 0, 240, 239, 31}, {2, 2, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 1, 2}},
    {1, {127, 128, 0, 255, 255}, {2, 3}},
    {0, {1, 2, 3, 255, 0}, {5}},
    {0, {}, {0}},
};

TEST(ReducedHistogram, BinEdgesAndClearedRange) {
  for (const ReducedCase &c : kReducedCases) {
    SCOPED_TRACE(testing::Message() << "bits " << c.bits);
    std::vector<uint32_t> hist(c.bins.size() + 1, kUntouched);
    kel_image_histogram_n(c.pixels.data(), 1, static_cast<int32_t>(c.pixels.size()), c.bits,
                          hist.data());
    EXPECT_EQ(hist, then_untouched(c.bins));
  }
}

// The laned count must equal one increment per pixel, for every width of bin and for sizes
// that leave 1, 2 or 3 pixels after the last group of four. Bits above 8 count the full
// histogram and write no bin past 256.
TEST(ReducedHistogram, MatchesThePlainCountOnRandomImages) {
  std::mt19937 rng(11);
  // rows, columns, number of distinct values (1: one long run of a single value)
  const uint32_t images[][3] = {{1, 1, 256},  {1, 2, 256}, {1, 3, 256},    {3, 5, 256},
                                {7, 13, 256}, {33, 31, 1}, {101, 99, 256}, {99, 101, 3}};
  const uint32_t kBits[] = {0, 1, 2, 3, 4, 5, 6, 7, 8, 9, 32, UINT32_MAX};
  for (const auto &image : images) {
    std::vector<uint8_t> pixels(size_t{image[0]} * image[1]);
    for (uint8_t &p : pixels) p = static_cast<uint8_t>(77 + rng() % image[2]);
    for (uint32_t bits : kBits) {
      const uint32_t used = std::min(bits, 8u);
      std::vector<uint32_t> hist((size_t{1} << used) + 1, kUntouched);
      kel_image_histogram_n(pixels.data(), static_cast<int32_t>(image[0]),
                            static_cast<int32_t>(image[1]), bits, hist.data());
      EXPECT_EQ(hist, then_untouched(plain_histogram(pixels, used)))
          << image[0] << "x" << image[1] << " bits " << bits;
    }
  }
}

}  // namespace
