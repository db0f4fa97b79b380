// Every vector variant that this machine can run, forced in turn, against the plain loops: bit
// for bit, on random rows of lengths that are not multiples of any vector, at odd offsets, on
// extreme values and on sums that wrap.
#include <gtest/gtest.h>
#include <hwy/targets.h>

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <iterator>
#include <random>
#include <vector>

#include "kel_images.h"
#include "outside/image_filters_simd.h"
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

// An input row at each 4-byte offset from its output's alignment, which AVX-512 reads as pairs
// of aligned vectors joined.
TEST(SimdParity, RowsAtEachOffsetFromTheOutput) {
  std::mt19937 rng(15);
  Bytes buffer(16384 + 64);
  for (uint8_t &p : buffer) p = static_cast<uint8_t>(rng());
  const Bytes original = buffer;
  uint8_t *const out = buffer.data() + (64 - reinterpret_cast<uintptr_t>(buffer.data()) % 64) % 64;
  for_each_variant([&] {
    for (size_t offset = 0; offset < 64; offset += 4) {
      for (const size_t length : {size_t{5000}, size_t{190}}) {
        const uint8_t *in = out + 8192 + offset;
        const auto same = [&](auto plain_row, auto vector_row, auto... args) {
          Bytes expected(out, out + length);
          plain_row(in, length, args..., expected.data());
          vector_row(in, length, args..., out);
          const bool equal = std::equal(expected.begin(), expected.end(), out);
          buffer = original;
          return equal;
        };
        const uint16_t percent = 37;
        ASSERT_TRUE(same(kel::plain::brighten_row, kel::simd::brighten_row, percent)) << offset;
        ASSERT_TRUE(same(kel::plain::darken_row, kel::simd::darken_row, percent)) << offset;
        ASSERT_TRUE(same(kel::plain::blend_row, kel::simd::blend_row)) << offset;
        ASSERT_TRUE(same(kel::plain::paste_row_with_key, kel::simd::paste_row_with_key, in[5]))
            << offset;
        ASSERT_TRUE(same(kel::plain::blend_row_with_key, kel::simd::blend_row_with_key, in[5]))
            << offset;
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

// Our default blur and enlargement on the vector loops against the plain ones, on random sizes
// and on pictures of random pixels or of only 0 and 255, the largest steps between neighbours.
Bytes random_picture(size_t count, std::mt19937 &rng) {
  Bytes picture(count);
  const bool extremes = rng() % 2 != 0;
  for (uint8_t &p : picture) p = static_cast<uint8_t>(extremes ? (rng() % 2) * 255 : rng());
  return picture;
}

TEST(SimdParity, BlurApartAndInPlace) {
  std::mt19937 rng(15);
  std::uniform_int_distribution<int> side(1, 300);
  for_each_variant([&] {
    const kel::outside::FilterLoops plain = kel::outside::plain::filter_loops();
    const kel::outside::FilterLoops vector = kel::outside::simd::filter_loops();
    for (int i = 0; i < 40; ++i) {
      const auto height = static_cast<uint16_t>(i < 3 ? i + 1 : side(rng));
      const auto width = static_cast<uint16_t>(i < 3 ? 3 - i : side(rng));
      const Bytes in = random_picture(size_t{height} * width, rng);
      Bytes expected(in.size(), 7), actual(in.size(), 7);
      kel::outside::blur(plain, in.data(), height, width, expected.data());
      kel::outside::blur(vector, in.data(), height, width, actual.data());
      ASSERT_EQ(actual, expected) << height << " x " << width;
      actual = in;
      kel::outside::blur(vector, actual.data(), height, width, actual.data());
      ASSERT_EQ(actual, expected) << height << " x " << width << " in place";
    }
  });
}

// Factor 8 (the masked fill's), the factors whose weights are whole sixteenths and others;
// outputs up to a few pixels short of and well past the enlarged input, over several strips.
TEST(SimdParity, ScaleUpByFactors) {
  std::mt19937 rng(16);
  std::uniform_int_distribution<int> side(1, 60);
  std::uniform_int_distribution<int> beyond(-12, 40);
  const uint16_t factors[] = {8, 8, 8, 8, 1, 2, 3, 4, 5, 16};
  for_each_variant([&] {
    const kel::outside::FilterLoops plain = kel::outside::plain::filter_loops();
    const kel::outside::FilterLoops vector = kel::outside::simd::filter_loops();
    for (int i = 0; i < 40; ++i) {
      const uint16_t factor = factors[size_t(i) % std::size(factors)];
      const auto in_height = static_cast<uint16_t>(side(rng));
      const auto in_width = static_cast<uint16_t>(side(rng));
      const auto out_height = static_cast<uint16_t>(std::max(1, in_height * factor + beyond(rng)));
      const auto out_width = static_cast<uint16_t>(std::max(1, in_width * factor + beyond(rng)));
      const Bytes in = random_picture(size_t{in_height} * in_width, rng);
      Bytes expected(size_t{out_height} * out_width, 7), actual(expected);
      kel::outside::scale_up_bilinear(plain, in.data(), in_height, in_width, factor,
                                      expected.data(), out_height, out_width);
      kel::outside::scale_up_bilinear(vector, in.data(), in_height, in_width, factor, actual.data(),
                                      out_height, out_width);
      ASSERT_EQ(actual, expected) << in_height << " x " << in_width << " by " << factor << " to "
                                  << out_height << " x " << out_width;
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
