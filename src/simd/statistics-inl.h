// Vector variants of the statistics' pixel loops, compiled once per instruction set through
// simd/kernels_simd.cpp. Each does the first pixels of its run and returns how many; the plain
// body finishes the run.
#if defined(KEL_SIMD_STATISTICS_INL_H_) == defined(HWY_TARGET_TOGGLE)
#ifdef KEL_SIMD_STATISTICS_INL_H_
#undef KEL_SIMD_STATISTICS_INL_H_
#else
#define KEL_SIMD_STATISTICS_INL_H_
#endif

#include <hwy/highway.h>

#include <cstdint>
#include <cstring>

#include "kernels.h"

namespace kel {
namespace simd {
// The 256-bin count of every vector target, compiled once for the baseline instruction set
// (simd/count_four_ways.cpp): it uses no vector instructions, and the wider sets' flags only
// made the compiler schedule it worse.
size_t count_bins_four_ways(const uint8_t *pixels, size_t count, uint32_t bits, uint32_t *hist);
}  // namespace simd
}  // namespace kel

HWY_BEFORE_NAMESPACE();
namespace kel {
namespace simd {
namespace HWY_NAMESPACE {
namespace hn = hwy::HWY_NAMESPACE;

// The one-lane fallback target has no byte zips and sums, and an array of counters needs vectors
// of a size known when compiling; those targets take the pixel-by-pixel loops below alone.
#define KEL_STATISTICS_VECTORS (HWY_TARGET != HWY_SCALAR && !HWY_HAVE_SCALABLE)

using D8 = hn::ScalableTag<uint8_t>;
using V8 = hn::Vec<D8>;

// From this many pixels on, a run's head is summed alone up to a vector boundary.
constexpr size_t kAlignFrom = 4096;

// A byte counter takes at most this many vectors before it is emptied into the totals.
constexpr uint32_t kByteCounterVectors = 255;

template <class D>
uint64_t sum_of_lanes(D d, hn::Vec<D> v) {
  return hn::GetLane(hn::SumOfLanes(d, v));
}

// The most bins the comparing count below takes; wider histograms count pixel by pixel.
constexpr uint32_t kMostVectorBinBits = 4;

// The bin of a pixel is its top bits, so comparing the pixel's top bits (the rest masked off)
// with each bin's lowest value finds it. Each bin keeps one counter per byte lane, which
// subtracts the all-ones lanes of its comparison; a counter reaches at most 255 before it is
// added to the bin. Counts whole vectors and returns how many pixels they held.
template <uint32_t kBins>
size_t count_bins(const uint8_t *pixels, size_t count, uint32_t bits, uint32_t *hist) {
#if KEL_STATISTICS_VECTORS
  const D8 d;
  const hn::Repartition<uint64_t, D8> d64;
  const size_t lanes = hn::Lanes(d);
  const uint32_t shift = 8 - bits;
  const V8 top_mask = hn::Set(d, static_cast<uint8_t>(0xFF00u >> bits));
  size_t i = 0;
  while (count - i >= lanes) {
    const size_t vectors =
        (count - i) / lanes < kByteCounterVectors ? (count - i) / lanes : kByteCounterVectors;
    V8 counters[kBins];
    for (uint32_t bin = 0; bin < kBins; ++bin) counters[bin] = hn::Zero(d);
    for (size_t v = 0; v < vectors; ++v, i += lanes) {
      const V8 top = hn::And(hn::LoadU(d, pixels + i), top_mask);
      for (uint32_t bin = 0; bin < kBins; ++bin) {
        const auto in_bin = hn::Eq(top, hn::Set(d, static_cast<uint8_t>(bin << shift)));
        counters[bin] = hn::Sub(counters[bin], hn::VecFromMask(d, in_bin));
      }
    }
    // Each bin's total is below 2^31, so its 32 bits hold it.
    for (uint32_t bin = 0; bin < kBins; ++bin) {
      hist[bin] += static_cast<uint32_t>(sum_of_lanes(d64, hn::SumsOf8(counters[bin])));
    }
  }
  return i;
#else
  (void)pixels, (void)count, (void)bits, (void)hist;
  return 0;
#endif
}

size_t CountBins(const uint8_t *pixels, size_t count, uint32_t bits, uint32_t *hist) {
  switch (bits) {
    case 0:
      return count_bins<1>(pixels, count, bits, hist);
    case 1:
      return count_bins<2>(pixels, count, bits, hist);
    case 2:
      return count_bins<4>(pixels, count, bits, hist);
    case 3:
      return count_bins<8>(pixels, count, bits, hist);
    case kMostVectorBinBits:
      return count_bins<16>(pixels, count, bits, hist);
    default:
      return count_bins_four_ways(pixels, count, bits, hist);
  }
}

#if KEL_STATISTICS_VECTORS
// The squares of the 16-bit lanes, summed in pairs into 32-bit lanes. A lane holds a pixel
// (0 to 255), so each pair sum is at most 2 * 255^2 and fits exactly.
template <class D16>
hn::Vec<hn::Repartition<uint32_t, D16>> pair_squares(D16, hn::Vec<D16> pixels) {
  const hn::Repartition<int16_t, D16> di16;
  const hn::Repartition<int32_t, D16> di32;
  const hn::Vec<decltype(di16)> values = hn::BitCast(di16, pixels);
  hn::Vec<decltype(di32)> odd = hn::Zero(di32);
  const hn::Vec<decltype(di32)> even =
      hn::ReorderWidenMulAccumulate(di32, values, values, hn::Zero(di32), odd);
  return hn::BitCast(hn::Repartition<uint32_t, D16>(), hn::RearrangeToOddPlusEven(even, odd));
}
#endif

#if HWY_TARGET == HWY_AVX3_DL
// AVX-512 with byte dot products, which square a vector of pixels in one step.
//
// Adds the pixels of whole 512-byte blocks from pixels[i] to both sums with the byte dot
// product, which multiplies unsigned bytes by signed ones and adds each four products to a
// 32-bit lane without saturating. A pixel p read unsigned and, its top bit flipped, signed as
// q = p - 128 gives p * q = p^2 - 128 p: the squares are the dot products plus 128 times the
// plain sum. The plain sum is a dot product too, with ones, rather than a sum of absolute
// differences, which shares its port with the top bit's flip. Eight accumulators of each keep
// eight dot products in flight. Advances i past the blocks. Highway's choice of this target
// requires the 512-bit byte dot product, but its compile flags name only the 256-bit one.
__attribute__((target("avx512vnni"))) void sum_blocks(const uint8_t *pixels, size_t count,
                                                      size_t &i, PixelSums &result) {
  constexpr int kParts = 8;
  const __m512i top_bit = _mm512_set1_epi8(static_cast<char>(0x80));
  const __m512i ones = _mm512_set1_epi8(1);
  __m512i sums[kParts], dots[kParts];
  for (int part = 0; part < kParts; ++part) sums[part] = dots[part] = _mm512_setzero_si512();
  for (; count - i >= 64 * kParts; i += 64 * kParts) {
    __m512i p[kParts];
    for (int part = 0; part < kParts; ++part) {
      p[part] = _mm512_loadu_si512(pixels + i + 64 * part);
    }
    for (int part = 0; part < kParts; ++part) {
      dots[part] = _mm512_dpbusd_epi32(dots[part], p[part], _mm512_xor_si512(p[part], top_bit));
      sums[part] = _mm512_dpbusd_epi32(sums[part], p[part], ones);
    }
  }
  for (int part = 1; part < kParts; ++part) {
    dots[0] = _mm512_add_epi32(dots[0], dots[part]);
    sums[0] = _mm512_add_epi32(sums[0], sums[part]);
  }
  // The lanes are added as 64-bit pairs, so that no signed 32-bit sum wraps.
  const auto total = [](__m512i lanes) {
    const __m512i low_halves = _mm512_set1_epi64(0xFFFFFFFF);
    const __m512i pairs =
        _mm512_add_epi64(_mm512_and_si512(lanes, low_halves), _mm512_srli_epi64(lanes, 32));
    return static_cast<uint32_t>(_mm512_reduce_add_epi64(pairs));
  };
  const uint32_t sum = total(sums[0]);
  result.sum += sum;
  result.sum_of_squares += total(dots[0]) + 128 * sum;
}
#endif

#if KEL_STATISTICS_VECTORS
// The pixels of the lower and upper half of v, widened to 16 bits. A zip interleaves in memory
// order, and the byte of a 16-bit lane that comes first in memory is its low one only on
// little-endian CPUs: elsewhere the zeros go first.
#if defined(__BYTE_ORDER__) && __BYTE_ORDER__ == __ORDER_BIG_ENDIAN__
constexpr bool kLowByteFirst = false;
#else
constexpr bool kLowByteFirst = true;
#endif

template <class D16>
hn::Vec<D16> widen_lower(D16 d16, V8 v, V8 zero) {
  return kLowByteFirst ? hn::ZipLower(d16, v, zero) : hn::ZipLower(d16, zero, v);
}

template <class D16>
hn::Vec<D16> widen_upper(D16 d16, V8 v, V8 zero) {
  return kLowByteFirst ? hn::ZipUpper(d16, v, zero) : hn::ZipUpper(d16, zero, v);
}
#endif

// Both sums are wanted modulo 2^32 only, so 32-bit lanes may wrap: the lanes' total is still
// the true total modulo 2^32. The plain sum goes through 64-bit lanes, which the byte sums of
// SumsOf8 fill directly. Returns how many pixels it added: whole vectors, after a head that
// leads a long run to a vector boundary.
size_t SumPixels(const uint8_t *pixels, size_t count, PixelSums *sums) {
#if KEL_STATISTICS_VECTORS
  const D8 d;
  const size_t lanes = hn::Lanes(d);
  size_t i = 0;
  // A load that splits two cache lines costs about as much as two.
  if (count >= kAlignFrom) {
    i = (lanes - reinterpret_cast<uintptr_t>(pixels) % lanes) % lanes;
    plain::sum_pixels(pixels, i, sums);
  }
  PixelSums result = *sums;
#if HWY_TARGET == HWY_AVX3_DL
  sum_blocks(pixels, count, i, result);
#endif
  const hn::RepartitionToWide<D8> d16;
  const hn::Repartition<uint32_t, D8> d32;
  const hn::Repartition<uint64_t, D8> d64;
  const V8 zero = hn::Zero(d);
  hn::Vec<decltype(d64)> vector_sums = hn::Zero(d64);
  hn::Vec<decltype(d32)> squares = hn::Zero(d32);
  for (; count - i >= lanes; i += lanes) {
    const V8 v = hn::LoadU(d, pixels + i);
    vector_sums = hn::Add(vector_sums, hn::SumsOf8(v));
    squares = hn::Add(squares, pair_squares(d16, widen_lower(d16, v, zero)));
    squares = hn::Add(squares, pair_squares(d16, widen_upper(d16, v, zero)));
  }
  result.sum += static_cast<uint32_t>(sum_of_lanes(d64, vector_sums));
  // The 32-bit lanes are added in 64-bit pairs first: a reduction of 32-bit lanes may be signed
  // arithmetic inside the instruction set's helpers, where a wrap is undefined.
  const auto squares64 = hn::BitCast(d64, squares);
  const auto pairs =
      hn::Add(hn::And(squares64, hn::Set(d64, 0xFFFFFFFFu)), hn::ShiftRight<32>(squares64));
  result.sum_of_squares += static_cast<uint32_t>(sum_of_lanes(d64, pairs));
  *sums = result;
  return i;
#else
  (void)pixels, (void)count, (void)sums;
  return 0;
#endif
}

}  // namespace HWY_NAMESPACE
}  // namespace simd
}  // namespace kel
HWY_AFTER_NAMESPACE();

#endif  // KEL_SIMD_STATISTICS_INL_H_
