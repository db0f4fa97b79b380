// Every vector variant that this machine can run, forced in turn, against the plain loops: bit
// for bit, on random rows of lengths that are not multiples of any vector, at odd offsets, on
// extreme values and on sums that wrap.
#include <gtest/gtest.h>
#include <hwy/targets.h>

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <random>
#include <vector>

#include "kel_images.h"
#include "simd/pixel_ops_simd.h"
#include "simd/rotation_simd.h"
#include "simd/statistics_simd.h"
#include "test_support.h"

#if defined(HWY_COMPILE_ONLY_STATIC)
#include <hwy/highway.h>

// The baseline's copy kernel, which a build with Highway's headers alone calls directly.
namespace kel {
namespace simd {
namespace HWY_NAMESPACE {
void CopyRow(const uint8_t *in, size_t count, uint8_t *out);
}  // namespace HWY_NAMESPACE
}  // namespace simd
}  // namespace kel
#endif

namespace {

using Bytes = std::vector<uint8_t>;
using kel_test::for_each_variant;

// The library's calls reach the kernels of a vector instruction set, not the one-lane fallback,
// which hands its work to the plain loops.
TEST(SimdParity, TheLibraryCallsVectorKernels) {
#if defined(HWY_COMPILE_ONLY_STATIC)
  const int64_t target = HWY_STATIC_TARGET;
  EXPECT_EQ(kel::simd::composite_row_loops().copy, &kel::simd::HWY_NAMESPACE::CopyRow);
#else
  const int64_t target = hwy::SupportedAndGeneratedTargets().front();
#endif
  std::printf("vector kernels: %s\n", hwy::TargetName(target));
  EXPECT_NE(target, HWY_SCALAR);
  EXPECT_NE(target, HWY_EMU128);
}

// Lengths around every vector size and the byte counters' 255-vector limit, and some random
// ones; each row starts at an odd offset of its buffer.
std::vector<size_t> row_lengths(std::mt19937 &rng) {
  std::vector<size_t> lengths = {
      0,    1,  15,  16,  17,           31,           33,           63,
      64,   65, 127, 129, 255 * 16 + 1, 255 * 32 + 7, 255 * 64 - 1, 255 * 64 + 65,
      70001};
  std::uniform_int_distribution<size_t> any(0, 3000);
  for (int i = 0; i < 20; ++i) lengths.push_back(any(rng));
  return lengths;
}

// Random pixels, runs of one value and the extremes, each with a leading pad byte.
std::vector<Bytes> rows_of(size_t length, std::mt19937 &rng) {
  Bytes random(length + 1), zeros(length + 1, 0), full(length + 1, 255), stripes(length + 1);
  for (uint8_t &p : random) p = static_cast<uint8_t>(rng());
  for (size_t i = 0; i < stripes.size(); ++i) stripes[i] = (i / 3) % 2 ? 255 : 0;
  return {random, zeros, full, stripes};
}

TEST(SimdParity, HistogramsOfUpToSixteenBins) {
  std::mt19937 rng(11);
  for_each_variant([&] {
    for (const size_t length : row_lengths(rng)) {
      for (const Bytes &row : rows_of(length, rng)) {
        for (uint32_t bits = 0; bits <= kel::kMostVectorBinBits; ++bits) {
          std::vector<uint32_t> expected(17, 7), actual(17, 7);  // bins past 2^bits stay 7
          const auto count = static_cast<uint32_t>(length);
          kel::plain::count_top_bits(row.data() + 1, count, bits, expected.data());
          kel::simd::count_top_bits(row.data() + 1, count, bits, actual.data());
          ASSERT_EQ(actual, expected) << "length " << length << ", bits " << bits;
        }
      }
    }
  });
}

TEST(SimdParity, PixelSumsWrapLikeThePlainSums) {
  std::mt19937 rng(12);
  // 17,000,000 pixels of 255 wrap both sums, the squares many times over.
  const Bytes bright(17000001, 255);
  for_each_variant([&] {
    for (const size_t length : row_lengths(rng)) {
      for (const Bytes &row : rows_of(length, rng)) {
        const auto count = static_cast<uint32_t>(length);
        const kel::PixelSums expected = kel::plain::pixel_sums(row.data() + 1, count);
        const kel::PixelSums actual = kel::simd::pixel_sums(row.data() + 1, count);
        ASSERT_EQ(actual.sum, expected.sum) << "length " << length;
        ASSERT_EQ(actual.sum_of_squares, expected.sum_of_squares) << "length " << length;
      }
    }
    const kel::PixelSums expected = kel::plain::pixel_sums(bright.data() + 1, 17000000);
    const kel::PixelSums actual = kel::simd::pixel_sums(bright.data() + 1, 17000000);
    EXPECT_EQ(actual.sum, expected.sum);
    EXPECT_EQ(actual.sum_of_squares, expected.sum_of_squares);
  });
}

// The one-pass variance against its definition: the histogram, its mean, and the variance
// about that mean, on images whose sums wrap too.
TEST(SimdParity, ImageVarianceEqualsTheHistogramStatistics) {
  std::mt19937 rng(13);
  std::vector<Bytes> images;
  for (const size_t length : {size_t{1}, size_t{3}, size_t{1001}, size_t{300000}}) {
    for (Bytes &row : rows_of(length, rng)) images.push_back(std::move(row));
  }
  Bytes extremes(16843010 + 1);  // the mean sum wraps just past 16843009 pixels of 255
  for (size_t i = 0; i < extremes.size(); ++i) extremes[i] = i % 5 ? 255 : 0;
  images.push_back(extremes);
  for_each_variant([&] {
    for (const Bytes &image : images) {
      const auto width = static_cast<int32_t>(image.size() - 1);
      uint32_t hist[256];
      kel_image_histogram(image.data() + 1, 1, width, hist);
      const uint8_t mean = kel_hist_mean(hist, static_cast<uint32_t>(width));
      uint8_t mean_out = 0;
      ASSERT_EQ(kel_image_var(image.data() + 1, 1, width, &mean_out),
                kel_hist_var(hist, mean, static_cast<uint32_t>(width)))
          << "width " << width;
      ASSERT_EQ(mean_out, mean);
    }
  });
}

TEST(SimdParity, BrightenAndDarkenEveryPercentageAndPixel) {
  Bytes all_values(1 + 256 * 3);
  for (size_t i = 1; i < all_values.size(); ++i) all_values[i] = static_cast<uint8_t>(i * 7);
  for_each_variant([&] {
    for (uint16_t percent = 0; percent <= 100; ++percent) {
      for (const size_t length : {size_t{256 * 3}, size_t{200}, size_t{5}}) {
        Bytes expected(length), actual(length);
        kel::plain::brighten_row(all_values.data() + 1, length, percent, expected.data());
        kel::simd::brighten_row(all_values.data() + 1, length, percent, actual.data());
        ASSERT_EQ(actual, expected) << "brighten " << percent;
        kel::plain::darken_row(all_values.data() + 1, length, percent, expected.data());
        kel::simd::darken_row(all_values.data() + 1, length, percent, actual.data());
        ASSERT_EQ(actual, expected) << "darken " << percent;
        // In place.
        Bytes in_place(all_values.begin() + 1,
                       all_values.begin() + 1 + static_cast<std::ptrdiff_t>(length));
        kel::simd::darken_row(in_place.data(), length, percent, in_place.data());
        ASSERT_EQ(in_place, expected) << "darken in place " << percent;
      }
    }
  });
}

// Rows of paste and blend, with and without a key, on separate rows and on a destination that
// starts before its source in the same buffer, which the vector variants may read ahead on.
TEST(SimdParity, PasteAndBlendRows) {
  std::mt19937 rng(14);
  for_each_variant([&] {
    for (const size_t length : row_lengths(rng)) {
      for (const Bytes &source : rows_of(length, rng)) {
        Bytes target(length + 1);
        for (uint8_t &p : target) p = static_cast<uint8_t>(rng());
        const uint8_t keys[] = {0, 255, source.size() > 5 ? source[5] : uint8_t{9}};
        const auto separate = [&](auto plain_row, auto vector_row, auto... key) {
          Bytes expected = target, actual = target;
          plain_row(source.data() + 1, length, key..., expected.data() + 1);
          vector_row(source.data() + 1, length, key..., actual.data() + 1);
          return expected == actual;
        };
        // The destination 3 bytes before its source, in one buffer.
        const auto overlapping = [&](auto plain_row, auto vector_row, auto... key) {
          Bytes expected(source), actual(source);
          expected.insert(expected.begin(), 3, uint8_t{1});
          actual.insert(actual.begin(), 3, uint8_t{1});
          plain_row(expected.data() + 4, length, key..., expected.data() + 1);
          vector_row(actual.data() + 4, length, key..., actual.data() + 1);
          return expected == actual;
        };
        ASSERT_TRUE(separate(kel::plain::copy_row, kel::simd::copy_row)) << length;
        ASSERT_TRUE(overlapping(kel::plain::copy_row, kel::simd::copy_row)) << length;
        ASSERT_TRUE(separate(kel::plain::blend_row, kel::simd::blend_row)) << length;
        ASSERT_TRUE(overlapping(kel::plain::blend_row, kel::simd::blend_row)) << length;
        for (const uint8_t key : keys) {
          ASSERT_TRUE(separate(kel::plain::paste_row_with_key, kel::simd::paste_row_with_key, key))
              << length << " key " << int{key};
          ASSERT_TRUE(
              overlapping(kel::plain::paste_row_with_key, kel::simd::paste_row_with_key, key))
              << length << " key " << int{key};
          ASSERT_TRUE(separate(kel::plain::blend_row_with_key, kel::simd::blend_row_with_key, key))
              << length << " key " << int{key};
          ASSERT_TRUE(
              overlapping(kel::plain::blend_row_with_key, kel::simd::blend_row_with_key, key))
              << length << " key " << int{key};
        }
      }
    }
  });
}

// fractions 1/16384 give exactly -2^28 + 1, which must become 0.
TEST(SimdParity, SignedRotationTruncatesTowardZeroAtTheLastUnit) {
  std::vector<int8_t> source(8 * 8, -1);
  source[1 * 8 + 1] = 0;
  const kel::simd::RotationRow run{source.data(), 8, 8, 1, 1, 0, 0, 64};
  for_each_variant([&] {
    std::vector<int8_t> out(64, 99);
    const size_t done = kel::simd::rotate_row_bilinear(run, out.data());
    for (size_t i = 0; i < done; ++i) ASSERT_EQ(out[i], 0) << i;
  });
}

}  // namespace
