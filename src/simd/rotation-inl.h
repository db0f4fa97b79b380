// Vector variants of the rotations' runs: consecutive canvas pixels of a row, every one of
// which maps inside the source. Compiled once per instruction set through
// simd/kernels_simd.cpp; each does whole vectors and returns how many pixels it did.
//
// Lanes are 32-bit. The variants take only sources below 2^16 on each side and below 2^31
// pixels, so every position inside the source (below 2^16 * 16384 = 2^30), every step between
// them and every byte offset fits a lane exactly; they leave other runs to the plain body.
#if defined(KEL_SIMD_ROTATION_INL_H_) == defined(HWY_TARGET_TOGGLE)
#ifdef KEL_SIMD_ROTATION_INL_H_
#undef KEL_SIMD_ROTATION_INL_H_
#else
#define KEL_SIMD_ROTATION_INL_H_
#endif

#include <hwy/highway.h>

#include "kernels.h"

HWY_BEFORE_NAMESPACE();
namespace kel {
namespace simd {
namespace HWY_NAMESPACE {
namespace hn = hwy::HWY_NAMESPACE;

using D32 = hn::ScalableTag<int32_t>;
using V32 = hn::Vec<D32>;

constexpr int32_t kFractionMask = 16383;

// Source positions of a vector of consecutive canvas pixels, 14 fraction bits.
struct Positions {
  V32 x, y;
};

// The run in 32-bit lanes, as the variants read it.
struct LaneRun {
  const void *src;
  int32_t height, width;
  int32_t x, y, step_x, step_y;
  size_t count;
};

// Whether the run's source keeps every position and offset inside a 32-bit lane, and has at
// least `least_pixels` pixels.
bool fits_lanes(const RotationRun &run, int64_t least_pixels) {
  return run.width < (1 << 16) && run.height < (1 << 16) &&
         run.width * run.height < (int64_t{1} << 31) && run.width * run.height >= least_pixels;
}

LaneRun lanes_of(const RotationRun &run) {
  return {run.src,
          static_cast<int32_t>(run.height),
          static_cast<int32_t>(run.width),
          static_cast<int32_t>(run.x),
          static_cast<int32_t>(run.y),
          run.step_x,
          run.step_y,
          run.count};
}

Positions first_positions(D32 d, const LaneRun &row) {
  const V32 lane = hn::Iota(d, 0);
  return {hn::Add(hn::Set(d, row.x), hn::Mul(lane, hn::Set(d, row.step_x))),
          hn::Add(hn::Set(d, row.y), hn::Mul(lane, hn::Set(d, row.step_y)))};
}

// The byte offset of each lane's whole-pixel position (x0, y0).
V32 pixel_offsets(const Positions &p, V32 width) {
  return hn::Add(hn::Mul(hn::ShiftRight<14>(p.y), width), hn::ShiftRight<14>(p.x));
}

// For each lane, low(pairs) * low(weights) + high(pairs) * high(weights), the halves read as
// signed 16-bit values: the pairwise multiply-add of the instruction sets. Exact, since both sums
// used here stay below 2^31 in magnitude.
V32 pair_dot(D32 d, V32 pairs, V32 weights) {
#if HWY_TARGET == HWY_SCALAR
  // One lane has no 16-bit halves to reinterpret; take them apart instead.
  (void)d;
  const auto low = [](V32 v) { return hn::ShiftRight<16>(hn::ShiftLeft<16>(v)); };
  return hn::Add(hn::Mul(low(pairs), low(weights)),
                 hn::Mul(hn::ShiftRight<16>(pairs), hn::ShiftRight<16>(weights)));
#else
  const hn::Repartition<int16_t, D32> d16;
  V32 odd = hn::Zero(d);
  const V32 even = hn::ReorderWidenMulAccumulate(d, hn::BitCast(d16, pairs),
                                                 hn::BitCast(d16, weights), hn::Zero(d), odd);
  return hn::RearrangeToOddPlusEven(even, odd);
#endif
}

// The weights (16384 - f, f) of a fraction f as a pair of 16-bit halves.
V32 weight_pair(D32 d, V32 fraction) {
  return hn::Or(hn::Sub(hn::Set(d, 16384), fraction), hn::ShiftLeft<16>(fraction));
}

// The pairs (P00, P10) and (P01, P11) of each lane as its 16-bit halves, the low half the left
// neighbour: the operands of pair_dot.
struct NeighbourPairs {
  V32 top, bottom;
};

// Where each lane's pairs come from: (P00, P10) are the first two bytes of a 4-byte read at the
// position's offset, (P01, P11) the last two of one at offset + width - 2. Both reads stay inside
// the source: a bilinear position has x0 + 1 < W and y0 + 1 < H, so the first read ends at byte
// (H - 1) * W + 1 at most and the second starts at byte W - 2 or later. A byte shuffle spreads
// each pair into the halves of its lane. Its indices are places in memory, so the halves hold the
// same values in either byte order; taking the word apart by shifts would assume that its first
// byte in memory is its low one, as only on little-endian CPUs. Each lane takes bytes of its own
// word only, so the one-lane fallback target shuffles too.
class NeighbourReader {
 public:
  NeighbourReader(D32 d, const uint8_t *src, int32_t width)
      : words_(reinterpret_cast<const int32_t *>(src)), below_(hn::Set(d, width - 2)) {
    // Shuffle indices count bytes from the start of each 16-byte block, four lanes to a block;
    // an index of 0x80 gives a zero byte.
    const V32 lane_start = hn::ShiftLeft<2>(hn::And(hn::Iota(d, 0), hn::Set(d, 3)));
    const V32 in_lane = hn::Or(lane_start, hn::ShiftLeft<16>(lane_start));
    first_two_ = hn::Or(in_lane, hn::Set(d, static_cast<int32_t>(0x80018000u)));
    last_two_ = hn::Or(in_lane, hn::Set(d, static_cast<int32_t>(0x80038002u)));
  }

  NeighbourPairs pairs(D32 d, V32 offset) const {
    const V32 upper = hn::GatherOffset(d, words_, offset);
    const V32 lower = hn::GatherOffset(d, words_, hn::Add(offset, below_));
    return {hn::TableLookupBytesOr0(upper, first_two_), hn::TableLookupBytesOr0(lower, last_two_)};
  }

 private:
  const int32_t *words_;
  V32 below_, first_two_, last_two_;
};

// The bilinear total ay * top + fy * bottom, with ay = 2^14 - fy, is 2^14 * top + fy * diff for
// diff = bottom - top; it reaches 255 * 2^28, beyond a 32-bit lane, and its quotient by 2^28 is
// found without it. Split diff = 2^14 * high + low (high the arithmetic shift, |high| <= 2^8,
// low in [0, 2^14)): fy * diff = 2^14 * fy * high + fy * low, each product exact in 32 bits, and
// fy * low = 2^14 * s + r with s = (fy * low) >> 14 and r in [0, 2^14). So total = 2^14 * n + r
// with n = top + fy * high + s, and, as floor((n + f) / m) = floor(n / m) for integers n and
// m >= 1 when 0 <= f < 1, floor(total / 2^28) = n >> 14. Adding 2^28 - 1 to the total, which
// adds 2^14 - 1 to both n and fy * low, gives the ceiling the same way. The pixel truncates
// toward zero: the floor for a total of 0 or more (a floor of 0 or more), the ceiling below.
template <bool kSigned>
V32 bilinear_pixels(D32 d, const NeighbourPairs &pixels, V32 fx, V32 fy) {
  const V32 across = weight_pair(d, fx);
  const V32 top = pair_dot(d, pixels.top, across);
  const V32 diff = hn::Sub(pair_dot(d, pixels.bottom, across), top);
  // fy has no high half, so each pair_dot is the one product of the low halves.
  const V32 top_and_high = hn::Add(top, pair_dot(d, hn::ShiftRight<14>(diff), fy));
  const V32 low_product = pair_dot(d, hn::And(diff, hn::Set(d, kFractionMask)), fy);
  const V32 floor = hn::ShiftRight<14>(hn::Add(top_and_high, hn::ShiftRight<14>(low_product)));
  if (!kSigned) return floor;  // the total is never negative
  // The signed pixels were read as s + 128; the weights add up to 2^28, so the total is 128 * 2^28
  // more than the signed one, and each quotient 128 more.
  const V32 bias = hn::Set(d, 128);
  const V32 almost_one = hn::Set(d, kFractionMask);
  const V32 low_up = hn::ShiftRight<14>(hn::Add(low_product, almost_one));
  const V32 ceiling = hn::ShiftRight<14>(hn::Add(hn::Add(top_and_high, low_up), almost_one));
  return hn::Sub(hn::IfThenElse(hn::Lt(floor, bias), ceiling, floor), bias);
}

template <typename Pixel>
void store_pixels(V32 values, Pixel *out) {
#if HWY_ARCH_X86 && HWY_TARGET <= HWY_AVX3
  // Every value fits its pixel, so keeping each lane's low byte is exact: one instruction where
  // the saturating demotion packs twice and permutes.
  _mm_storeu_si128(reinterpret_cast<__m128i *>(out), _mm512_cvtepi32_epi8(values.raw));
#else
  const hn::Rebind<Pixel, D32> d8;
  hn::StoreU(hn::DemoteTo(d8, values), d8, out);
#endif
}

template <bool kSigned, typename Pixel>
size_t bilinear_row(const LaneRun &row, Pixel *out) {
  const D32 d;
  const size_t lanes = hn::Lanes(d);
  const auto *src = static_cast<const uint8_t *>(row.src);
  Positions p = first_positions(d, row);
  const V32 advance_x = hn::Set(d, row.step_x * static_cast<int32_t>(lanes));
  const V32 advance_y = hn::Set(d, row.step_y * static_cast<int32_t>(lanes));
  const V32 fraction = hn::Set(d, kFractionMask);
  const NeighbourReader reader(d, src, row.width);
  // Locals, as the stores to the canvas could alias the row's fields.
  const V32 width = hn::Set(d, row.width);
  const size_t count = row.count;
  // A signed pixel s is read as the unsigned s + 128 (its top bit flipped), which needs no sign
  // extension; bilinear_pixels takes the 128 back off.
  const V32 pair_top_bits = hn::Set(d, 0x00800080);
  size_t done = 0;
  for (; done + lanes <= count; done += lanes) {
    NeighbourPairs pixels = reader.pairs(d, pixel_offsets(p, width));
    if (kSigned) {
      pixels.top = hn::Xor(pixels.top, pair_top_bits);
      pixels.bottom = hn::Xor(pixels.bottom, pair_top_bits);
    }
    const V32 values =
        bilinear_pixels<kSigned>(d, pixels, hn::And(p.x, fraction), hn::And(p.y, fraction));
    store_pixels(values, out + done);
    p.x = hn::Add(p.x, advance_x);
    p.y = hn::Add(p.y, advance_y);
  }
  return done;
}

size_t BilinearRowU8(const RotationRun &run, uint8_t *out) {
  return fits_lanes(run, 1) ? bilinear_row<false>(lanes_of(run), out) : 0;
}

size_t BilinearRowI8(const RotationRun &run, int8_t *out) {
  return fits_lanes(run, 1) ? bilinear_row<true>(lanes_of(run), out) : 0;
}

// One 4-byte read per lane holds the pixel: at its own offset where the source has three more
// bytes after it, else ending at it (the last pixels of the source). Only sources of four pixels
// or more are taken, so both reads stay inside.
size_t nearest_row(const LaneRun &row, int8_t *out) {
  const D32 d;
  const size_t lanes = hn::Lanes(d);
  const auto *words = static_cast<const int32_t *>(row.src);
  Positions p = first_positions(d, row);
  const V32 advance_x = hn::Set(d, row.step_x * static_cast<int32_t>(lanes));
  const V32 advance_y = hn::Set(d, row.step_y * static_cast<int32_t>(lanes));
  const V32 last_read = hn::Set(d, row.width * row.height - 4);
  const V32 width = hn::Set(d, row.width);
  // Shuffle indices as in NeighbourReader, for each lane's top byte; its other three are zeroed.
  const V32 lane_top =
      hn::Or(hn::ShiftLeft<26>(hn::And(hn::Iota(d, 0), hn::Set(d, 3))), hn::Set(d, 0x808080));
  const size_t count = row.count;
  size_t done = 0;
  for (; done + lanes <= count; done += lanes) {
    const V32 offset = pixel_offsets(p, width);
    const V32 read_at = hn::Min(offset, last_read);
    const V32 word = hn::GatherOffset(d, words, read_at);
    // The pixel is byte (offset - read_at) of the word in memory order: a byte shuffle moves it
    // to the top, in either byte order (a shift by its number would assume little-endian), and
    // the arithmetic shift sign-extends it.
    const V32 pick = hn::Or(hn::ShiftLeft<24>(hn::Sub(offset, read_at)), lane_top);
    const V32 value = hn::ShiftRight<24>(hn::TableLookupBytesOr0(word, pick));
    // -128 marks uncovered pixels, so a covered -128 is stored as -127.
    store_pixels(hn::Max(value, hn::Set(d, -127)), out + done);
    p.x = hn::Add(p.x, advance_x);
    p.y = hn::Add(p.y, advance_y);
  }
  return done;
}

size_t NearestRowI8(const RotationRun &run, int8_t *out) {
  return fits_lanes(run, 4) ? nearest_row(lanes_of(run), out) : 0;
}

}  // namespace HWY_NAMESPACE
}  // namespace simd
}  // namespace kel
HWY_AFTER_NAMESPACE();

#endif  // KEL_SIMD_ROTATION_INL_H_
