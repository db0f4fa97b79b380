// The kernel table of our blur and enlargement for every instruction set Highway builds for, and
// the run-time choice among them. Each variant does the whole vectors of its row and returns how
// many pixels they covered; the plain bodies in image_filters.cpp, the reference, finish the row.
#undef HWY_TARGET_INCLUDE
#define HWY_TARGET_INCLUDE "image_filters_simd.cpp"
#include "image_filters_simd.h"

#include <hwy/foreach_target.h>  // must come before highway.h
#include <hwy/highway.h>

#include <cstdint>

HWY_BEFORE_NAMESPACE();
namespace kel {
namespace outside {
namespace simd {
namespace HWY_NAMESPACE {
namespace hn = hwy::HWY_NAMESPACE;

// The one-lane fallback target has no 16-bit view of a byte vector; its table is the plain one.
#if HWY_TARGET != HWY_SCALAR

// Runs step(d, i) on whole byte vectors of the row, full ones and then 16- and 8-byte ones for
// the rest, and returns how many pixels they covered. The plain body, one pixel at a time, is
// left fewer than 8.
template <class Step>
size_t for_each_vector(size_t count, Step step) {
  size_t i = 0;
  const hn::ScalableTag<uint8_t> d;
  for (; count - i >= hn::Lanes(d); i += hn::Lanes(d)) step(d, i);
  const hn::CappedTag<uint8_t, 16> d16;
  for (; count - i >= hn::Lanes(d16); i += hn::Lanes(d16)) step(d16, i);
  const hn::CappedTag<uint8_t, 8> d8;
  if (count - i >= hn::Lanes(d8)) {
    step(d8, i);
    i += hn::Lanes(d8);
  }
  return i;
}

// (a + 2b + c + 2) >> 2 as two rounded 8-bit averages: the outer pair's rounded-down average
// (the rounded-up one less the odd bit it added), then its rounded-up average with the centre.
template <class D>
hn::Vec<D> smooth(D d, hn::Vec<D> before, hn::Vec<D> centre, hn::Vec<D> after) {
  const auto outer =
      hn::Sub(hn::AverageRound(before, after), hn::And(hn::Xor(before, after), hn::Set(d, 1)));
  return hn::AverageRound(outer, centre);
}

// The high bytes of the 16-bit lanes of `lower` and then `upper`, in order: the totals >> 8 of
// the enlargement. A lane's high byte is its second in memory on little-endian CPUs and its
// first on big-endian ones, such as s390x with Highway's four-lane portable target.
template <class D8, class V16>
hn::Vec<D8> high_bytes(D8 d8, V16 lower, V16 upper) {
#if defined(__BYTE_ORDER__) && __BYTE_ORDER__ == __ORDER_BIG_ENDIAN__
  return hn::ConcatEven(d8, hn::BitCast(d8, upper), hn::BitCast(d8, lower));
#else
  return hn::ConcatOdd(d8, hn::BitCast(d8, upper), hn::BitCast(d8, lower));
#endif
}

size_t SmoothTriples(const uint8_t *src, size_t count, uint8_t *dst) {
  return for_each_vector(count, [&](auto d, size_t i) {
    hn::StoreU(
        smooth(d, hn::LoadU(d, src + i), hn::LoadU(d, src + i + 1), hn::LoadU(d, src + i + 2)), d,
        dst + i);
  });
}

// Both passes of the pixels i .. i + lanes - 1, each load before the stores: with rows of 2048
// pixels `lower` lies 4096 bytes past `upper`, and a load after a store to an address equal in
// its low 12 bits waits for it.
template <class D>
struct AcrossAndDown {
  hn::Vec<D> across, result;
  AcrossAndDown(D d, const uint8_t *row, const uint8_t *upper, const uint8_t *centre, size_t i)
      : across(
            smooth(d, hn::LoadU(d, row + i), hn::LoadU(d, row + i + 1), hn::LoadU(d, row + i + 2))),
        result(smooth(d, hn::LoadU(d, upper + i), hn::LoadU(d, centre + i), across)) {}
  void store(D d, uint8_t *upper, uint8_t *lower, size_t i) const {
    hn::StoreU(across, d, lower + i);
    hn::StoreU(result, d, upper + i);
  }
};

// A store that straddles two cache lines costs two, and the rows start one pixel into the
// output, so full vectors are stored at addresses aligned in `upper` (and in `lower` too when
// the row length is a multiple of the vector). The pixels before the first such address are
// covered by one vector from the start, computed, like the first aligned one it overlaps, from
// the original `upper` before either is stored: both store the same values where they meet.
size_t SmoothAcrossAndDown(const uint8_t *row, size_t count, uint8_t *upper, const uint8_t *centre,
                           uint8_t *lower) {
  const hn::ScalableTag<uint8_t> d;
  const size_t lanes = hn::Lanes(d);
  const size_t head = (lanes - reinterpret_cast<uintptr_t>(upper) % lanes) % lanes;
  size_t start = 0;
  if (head != 0 && count >= head + lanes) {
    const AcrossAndDown<decltype(d)> first(d, row, upper, centre, 0);
    const AcrossAndDown<decltype(d)> aligned(d, row, upper, centre, head);
    first.store(d, upper, lower, 0);
    aligned.store(d, upper, lower, head);
    start = head + lanes;
  }
  return start + for_each_vector(count - start, [&](auto dv, size_t i) {
           AcrossAndDown<decltype(dv)>(dv, row, upper, centre, start + i)
               .store(dv, upper, lower, start + i);
         });
}

// Each vector of `below` is read before the same pixels of `row` are written, so `below` may
// be `row` itself.
size_t SmoothDownCarrying(uint8_t *above, uint8_t *row, const uint8_t *below, size_t count) {
  return for_each_vector(count, [&](auto d, size_t i) {
    const auto centre = hn::LoadU(d, row + i);
    hn::StoreU(smooth(d, hn::LoadU(d, above + i), centre, hn::LoadU(d, below + i)), d, row + i);
    hn::StoreU(centre, d, above + i);
  });
}

// In 16-bit lanes, each widened from bytes; the sum is taken modulo 2^16 as in the plain loop.
size_t BlendSpread(const uint8_t *spread, const uint8_t *odd, size_t count, uint16_t *pairs) {
  const hn::ScalableTag<uint16_t> d16;
  const hn::Rebind<uint8_t, decltype(d16)> d8;
  const size_t lanes = hn::Lanes(d16);
  size_t i = 0;
  for (; count - i >= lanes; i += lanes) {
    const auto sample = hn::PromoteTo(d16, hn::LoadU(d8, spread + i));
    const auto next = hn::PromoteTo(d16, hn::LoadU(d8, spread + i + 8));
    const auto weight = hn::PromoteTo(d16, hn::LoadU(d8, odd + i));
    hn::StoreU(hn::Add(hn::ShiftLeft<4>(sample), hn::Mul(weight, hn::Sub(next, sample))), d16,
               pairs + i);
  }
  return i;
}

// A byte vector's worth of columns at a time, as two vectors of 16-bit totals.
size_t MixEightRows(const uint16_t *upper, const uint16_t *lower, size_t count, uint8_t *out,
                    size_t stride) {
  return for_each_vector(count, [&](auto d8, size_t i) {
    const hn::Repartition<uint16_t, decltype(d8)> d16;
    const size_t half = hn::Lanes(d16);
    const auto upper_low = hn::LoadU(d16, upper + i);
    const auto upper_high = hn::LoadU(d16, upper + i + half);
    const auto difference_low = hn::Sub(hn::LoadU(d16, lower + i), upper_low);
    const auto difference_high = hn::Sub(hn::LoadU(d16, lower + i + half), upper_high);
    const auto rounding = hn::Set(d16, 128);
    auto total_low = hn::Add(hn::Add(hn::ShiftLeft<4>(upper_low), rounding), difference_low);
    auto total_high = hn::Add(hn::Add(hn::ShiftLeft<4>(upper_high), rounding), difference_high);
    const auto step_low = hn::Add(difference_low, difference_low);
    const auto step_high = hn::Add(difference_high, difference_high);
    for (size_t j = 0; j < 8; ++j) {
      hn::StoreU(high_bytes(d8, total_low, total_high), d8, out + j * stride + i);
      total_low = hn::Add(total_low, step_low);
      total_high = hn::Add(total_high, step_high);
    }
  });
}

// The total is at most 4080 * 16 + 128, so it fits a 16-bit lane.
size_t BlendRowsCoarse(const uint16_t *top, const uint16_t *bottom, uint32_t weight_bottom,
                       size_t count, uint8_t *out) {
  const auto bottom_part = static_cast<uint16_t>(weight_bottom >> 4);
  const auto top_part = static_cast<uint16_t>(16 - bottom_part);
  return for_each_vector(count, [&](auto d8, size_t i) {
    const hn::Repartition<uint16_t, decltype(d8)> d16;
    const size_t half = hn::Lanes(d16);
    const auto top_weight = hn::Set(d16, top_part);
    const auto bottom_weight = hn::Set(d16, bottom_part);
    const auto rounding = hn::Set(d16, 128);
    const auto total_low = hn::Add(hn::Add(hn::Mul(hn::LoadU(d16, top + i), top_weight),
                                           hn::Mul(hn::LoadU(d16, bottom + i), bottom_weight)),
                                   rounding);
    const auto total_high =
        hn::Add(hn::Add(hn::Mul(hn::LoadU(d16, top + i + half), top_weight),
                        hn::Mul(hn::LoadU(d16, bottom + i + half), bottom_weight)),
                rounding);
    hn::StoreU(high_bytes(d8, total_low, total_high), d8, out + i);
  });
}

constexpr FilterKernels kTable = {SmoothTriples, SmoothAcrossAndDown, SmoothDownCarrying,
                                  BlendSpread,   MixEightRows,        BlendRowsCoarse};
#else
constexpr FilterKernels kTable = kPlainFilterKernels;
#endif

const FilterKernels *TargetFilterKernels() {
  return &kTable;
}

}  // namespace HWY_NAMESPACE
}  // namespace simd
}  // namespace outside
}  // namespace kel
HWY_AFTER_NAMESPACE();

#if HWY_ONCE
namespace kel {
namespace outside {
namespace simd {

HWY_EXPORT(TargetFilterKernels);

// Dispatched from the getter's own namespace: where Highway is built in with its headers alone,
// the dispatch is static and names the getter, as written here, inside the target's namespace.
const FilterKernels *ChosenFilterKernels() {
  return HWY_DYNAMIC_DISPATCH(TargetFilterKernels)();
}

}  // namespace simd

const FilterKernels &filter_kernels() {
  return *simd::ChosenFilterKernels();
}

}  // namespace outside
}  // namespace kel
#endif  // HWY_ONCE
