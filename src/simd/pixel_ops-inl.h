// Vector variants of the pixel operations' rows, compiled once per instruction set through
// simd/kernels_simd.cpp. Each does the first pixels of its row and returns how many; the plain
// body finishes the row.
#if defined(KEL_SIMD_PIXEL_OPS_INL_H_) == defined(HWY_TARGET_TOGGLE)
#ifdef KEL_SIMD_PIXEL_OPS_INL_H_
#undef KEL_SIMD_PIXEL_OPS_INL_H_
#else
#define KEL_SIMD_PIXEL_OPS_INL_H_
#endif

#include <hwy/highway.h>

#include <cstdint>
#include <cstring>
#include <type_traits>

#include "kernels.h"

HWY_BEFORE_NAMESPACE();
namespace kel {
namespace simd {
namespace HWY_NAMESPACE {
namespace hn = hwy::HWY_NAMESPACE;

// The one-lane fallback target has no 16-bit view of a byte vector; it takes the plain bodies.
#define KEL_PIXEL_OPS_VECTORS (HWY_TARGET != HWY_SCALAR)
// AVX-512 masks its byte loads and stores natively; elsewhere a masked store of bytes is a load,
// a blend and a store, or a loop over the lanes.
#define KEL_NATIVE_BYTE_MASKS (HWY_ARCH_X86 && HWY_TARGET <= HWY_AVX3)

using D8 = hn::ScalableTag<uint8_t>;

// Without native byte masks the keyed paste reads its destination (see keyed_row).
constexpr bool kPasteKeyedReadsOut = KEL_PIXEL_OPS_VECTORS && !KEL_NATIVE_BYTE_MASKS;

#if KEL_PIXEL_OPS_VECTORS
// floor(percent * base / 100) for a base of at most 255 is (base * factor) >> 16 with
// factor = ceil(percent * 2^16 / 100) when percent is below 100: factor / 2^16 exceeds
// percent / 100 by less than 2^-16, which adds less than 255 / 2^16 < 0.004 to a quotient whose
// fraction is at most 0.99, so no quotient reaches the next integer. One high-half multiply so
// replaces the product and the division. 100 percent (factor 2^16) does not fit 16 bits; the
// rows take it apart. The test checks every percentage and pixel.
uint16_t percent_factor(uint16_t percent) {
  return static_cast<uint16_t>((uint32_t{percent} * 65536 + 99) / 100);
}

// floor(percent * base / 100) of every byte, in 16-bit lanes. The even byte is multiplied on
// its own; the odd byte in place, as 256 times itself, so the high half of its product holds
// its change in the high byte (floor(floor(a / 256) / 256) = floor(a / 65536)) and one
// and-or puts both changes together with no shifts, which compete with the multiplies for the
// same ports. kComplement takes 255 - byte as the base.
template <bool kComplement, class D>
hn::Vec<D> change(D d, hn::Vec<D> pixels, uint16_t factor) {
  const hn::Repartition<uint16_t, D> d16;
  using V16 = hn::Vec<decltype(d16)>;
  const V16 words = hn::BitCast(d16, pixels);
  const V16 f = hn::Set(d16, factor);
  const V16 low = hn::Set(d16, 0x00FF);
  const V16 high = hn::Set(d16, 0xFF00);
  const V16 even = kComplement ? hn::AndNot(words, low) : hn::And(words, low);
  const V16 odd = kComplement ? hn::AndNot(words, high) : hn::And(words, high);
  const V16 even_change = hn::MulHigh(even, f);
  const V16 odd_change = hn::MulHigh(odd, f);
  return hn::BitCast(d, hn::OrAnd(even_change, odd_change, high));
}

// floor((a + b) / 2): the rounded average less the half that rounding added.
template <class D>
hn::Vec<D> floor_average(D d, hn::Vec<D> a, hn::Vec<D> b) {
  return hn::Sub(hn::AverageRound(a, b), hn::And(hn::Xor(a, b), hn::Set(d, 1)));
}

// The bytes from `at` to the next multiple of `size` (a power of two) at most `count`.
size_t bytes_to_boundary(const uint8_t *at, size_t size, size_t count) {
  const size_t gap = (size - reinterpret_cast<uintptr_t>(at) % size) % size;
  return gap < count ? gap : count;
}

// The `keep` of a row operation that writes every pixel.
struct EveryLane {};

#if KEL_NATIVE_BYTE_MASKS
// Writes the vector v to out[i ..] where keep(d, i, load) holds, and only in the first `head`
// lanes when head is given.
template <class D, class V, class Keep, class Load>
void store_vector(D d, size_t i, uint8_t *out, V v, const Keep &keep, const Load &load,
                  size_t head = 0) {
  constexpr bool kEvery = std::is_same<Keep, EveryLane>::value;
  if (head != 0) {
    const auto first = hn::FirstN(d, head);
    if constexpr (kEvery) {
      hn::BlendedStore(v, first, d, out + i);
    } else {
      hn::BlendedStore(v, hn::And(first, keep(d, i, load)), d, out + i);
    }
  } else if constexpr (kEvery) {
    hn::StoreU(v, d, out + i);
  } else {
    hn::BlendedStore(v, keep(d, i, load), d, out + i);
  }
}
#endif

// Loads a whole vector, once. Left alone, the compiler folds the load into each instruction
// that uses the pixels, and every one of those loads splits a cache line when the input is not
// aligned as the output is. The empty asm makes the loaded value one the compiler cannot load
// again.
struct LoadWhole {
  template <class D>
  hn::Vec<D> operator()(D d, const uint8_t *at) const {
    hn::Vec<D> v = hn::LoadU(d, at);
#if HWY_ARCH_X86 && HWY_TARGET != HWY_SCALAR && HWY_TARGET != HWY_EMU128
    asm("" : "+v"(v.raw));
#endif
    return v;
  }
};

// The shortest row whose lines are asked for ahead.
constexpr size_t kLongRow = 4096;

// Asks for the input line 2 KiB ahead, and for the output line there to be written: an image
// that fits in L2 but not L1 then streams through faster than the hardware's own prefetching
// brings it, and the arithmetic of a row overlaps the stream. Prefetches never fault, so lines
// past the row's end cost only the read; the addresses are made from integers, never from
// pointers out of range.
inline void prefetch_ahead(const uint8_t *in, const uint8_t *out) {
  constexpr uintptr_t kAhead = 2048;
  const uintptr_t read = reinterpret_cast<uintptr_t>(in) + kAhead;
  const uintptr_t write = reinterpret_cast<uintptr_t>(out) + kAhead;
#if KEL_NATIVE_BYTE_MASKS
  // Every processor with AVX-512 claims a line for writing with prefetchw.
  asm volatile("prefetcht0 (%0)\n\tprefetchw (%1)" : : "r"(read), "r"(write));
#else
  __builtin_prefetch(reinterpret_cast<const void *>(read), 0, 3);
  __builtin_prefetch(reinterpret_cast<const void *>(write), 1, 3);
#endif
}

// The whole vectors of a long row from pixel i on, a turn of at least two vectors and one whole
// line, each line asked for ahead once; returns the first pixel left.
template <class Value>
size_t long_row_vectors(const uint8_t *in, uint8_t *out, size_t i, size_t count,
                        const Value &value) {
  const D8 d;
  const size_t lanes = hn::Lanes(d);
  const LoadWhole whole;
  constexpr size_t kLine = 64;
  const size_t turn = 2 * lanes > kLine ? 2 * lanes : kLine;
  for (; count - i >= turn; i += turn) {
    for (size_t line = 0; line < turn; line += kLine) {
      prefetch_ahead(in + i + line, out + i + line);
    }
#pragma GCC unroll 4
    for (size_t v = 0; v < turn; v += lanes) hn::StoreU(value(d, i + v, whole), d, out + i + v);
  }
  return i;
}

// A row of at least one vector, in vectors of d: the lead vector, whole vectors from the
// output's first boundary on (middle(i) may do a stretch of them first and return where it
// stopped), and the last vector, ending at the row's end. Returns count.
template <class D, class Value, class Middle>
size_t overlapping_vectors(D d, uint8_t *out, size_t count, const Value &value,
                           const Middle &middle) {
  const size_t lanes = hn::Lanes(d);
  const LoadWhole whole;
  const size_t end = count - lanes;
  const auto last = value(d, end, whole);
  size_t i = bytes_to_boundary(out, lanes, count);
  if (i != 0) {
    const auto lead = value(d, 0, whole);
    if (i <= end) {
      const auto next = value(d, i, whole);
      hn::StoreU(lead, d, out);
      hn::StoreU(next, d, out + i);
      i += lanes;
    } else {
      hn::StoreU(lead, d, out);  // the lead and the last vector cover the row
    }
  }
  // Two vectors a turn: the loop's own count, compare and branch are otherwise a third of the
  // instructions of a turn of the short rows.
#pragma GCC unroll 2
  for (i = middle(i); i <= end; i += lanes) hn::StoreU(value(d, i, whole), d, out + i);
  hn::StoreU(last, d, out + end);
  return count;
}

template <class D, class Value>
size_t overlapping_vectors(D d, uint8_t *out, size_t count, const Value &value) {
  return overlapping_vectors(d, out, count, value, [](size_t from) { return from; });
}

// Runs a row operation and returns how many pixels it did: value(d, i, load) is what the vector
// of pixels from i becomes, keep(d, i, load) which of its lanes are written (EveryLane for all),
// both reading vectors with load(d, address). Full vectors start where the output is on a full
// vector's boundary, so that no store splits a cache line (the input rows commonly share the
// output's alignment, and then no load does either): a split store costs about two, and a
// sprite's rows seldom start on a boundary.
//
// With native byte masks the lanes before the boundary are one masked store of a vector that
// lies inside the row, and those after the last full vector, or of a row shorter than one, are
// one masked load and store. Elsewhere every row writes every pixel, so the ends are whole
// vectors that overlap their neighbours: the lead at the row's start and the last vector ending
// at its end. A vector that overlaps another is made before either is stored, from the bytes as
// the call found them, so the overlap is written twice with the same value, even where the
// output is an input (the blends, or a row done in place). Rows shorter than the narrowest
// vector are left to the plain body.
template <class Value, class Keep>
size_t for_each_vector(const uint8_t *in, uint8_t *out, size_t count, const Value &value,
                       const Keep &keep) {
  const D8 d;
  const size_t lanes = hn::Lanes(d);
#if KEL_NATIVE_BYTE_MASKS
  const LoadWhole whole;
  size_t i = 0;
  if (count >= lanes && bytes_to_boundary(out, lanes, count) != 0) {
    i = bytes_to_boundary(out, lanes, count);
    // The next vector is read before the masked store: a load that overlaps the vector of a
    // masked store would wait for the store to finish.
    const auto lead = value(d, 0, whole);
    if (count - i >= lanes) {
      const auto next = value(d, i, whole);
      store_vector(d, 0, out, lead, keep, whole, i);
      store_vector(d, i, out, next, keep, whole);
      i += lanes;
    } else {
      store_vector(d, 0, out, lead, keep, whole, i);
    }
  }
  // Only the operations that write every pixel run long rows; the keyed ones paste sprites.
  if constexpr (std::is_same<Keep, EveryLane>::value) {
    if (count >= kLongRow) i = long_row_vectors(in, out, i, count, value);
  }
  for (; count - i >= lanes; i += lanes) store_vector(d, i, out, value(d, i, whole), keep, whole);
  if (i != count) {
    const auto rest = hn::FirstN(d, count - i);
    const auto part = [&rest](D8 dd, const uint8_t *at) { return hn::MaskedLoad(rest, dd, at); };
    store_vector(d, i, out, value(d, i, part), keep, part, count - i);
  }
  return count;
#else
  static_assert(std::is_same<Keep, EveryLane>::value, "rows without native masks write all");
  (void)keep;
  const hn::CappedTag<uint8_t, 16> d16;
  if (count < lanes)
    return count < hn::Lanes(d16) ? 0 : overlapping_vectors(d16, out, count, value);
  return overlapping_vectors(d, out, count, value, [&](size_t from) {
    return count >= kLongRow ? long_row_vectors(in, out, from, count, value) : from;
  });
#endif
}

// Brighten (toward white) and darken (toward black) are one row loop: the change, floor(percent
// of the distance to the target), is added or taken off. At 100 percent every pixel moves the
// whole way, to 255 or to 0.
template <bool kTowardWhite>
size_t MoveRow(const uint8_t *in, size_t count, uint16_t percent, uint8_t *out) {
  if (percent >= 100) {
    std::memset(out, kTowardWhite ? 255 : 0, count);
    return count;
  }
  const uint16_t factor = percent_factor(percent);
  return for_each_vector(
      in, out, count,
      [&](auto d, size_t i, const auto &load) {
        const auto pixels = load(d, in + i);
        const auto moved = change<kTowardWhite>(d, pixels, factor);
        return kTowardWhite ? hn::Add(pixels, moved) : hn::Sub(pixels, moved);
      },
      EveryLane());
}

size_t BrightenRow(const uint8_t *in, size_t count, uint16_t percent, uint8_t *out) {
  return MoveRow<true>(in, count, percent, out);
}

size_t DarkenRow(const uint8_t *in, size_t count, uint16_t percent, uint8_t *out) {
  return MoveRow<false>(in, count, percent, out);
}

// With native byte masks a row is copied in whole vectors, its ends masked, faster than the C
// library's memmove copies it; elsewhere memmove, which the plain body calls, is as fast or
// faster.
size_t CopyRow(const uint8_t *in, size_t count, uint8_t *out) {
#if KEL_NATIVE_BYTE_MASKS
  return for_each_vector(
      in, out, count, [&](auto d, size_t i, const auto &load) { return load(d, in + i); },
      EveryLane());
#else
  (void)in, (void)count, (void)out;
  return 0;
#endif
}

size_t BlendRow(const uint8_t *in, size_t count, uint8_t *out) {
  return for_each_vector(
      in, out, count,
      [&](auto d, size_t i, const auto &load) {
        return floor_average(d, load(d, out + i), load(d, in + i));
      },
      EveryLane());
}

// The transparent pixels keep their destination bytes. With native byte masks they are left out
// of the store; elsewhere the row's bytes are chosen in a register, pixel or destination, and
// the whole vector stored, each input read once (a transparent byte is so written back with the
// value it holds, which the row's callers allow).
template <bool kBlend>
size_t keyed_row(const uint8_t *in, size_t count, uint8_t key, uint8_t *out) {
#if KEL_NATIVE_BYTE_MASKS
  return for_each_vector(
      in, out, count,
      [&](auto d, size_t i, const auto &load) {
        const auto pixels = load(d, in + i);
        return kBlend ? floor_average(d, load(d, out + i), pixels) : pixels;
      },
      [&](auto d, size_t i, const auto &load) { return hn::Ne(load(d, in + i), hn::Set(d, key)); });
#else
  return for_each_vector(
      in, out, count,
      [&](auto d, size_t i, const auto &load) {
        const auto pixels = load(d, in + i);
        const auto under = load(d, out + i);
        const auto changed = kBlend ? floor_average(d, under, pixels) : pixels;
        return hn::IfThenElse(hn::Ne(pixels, hn::Set(d, key)), changed, under);
      },
      EveryLane());
#endif
}

size_t PasteRowWithKey(const uint8_t *in, size_t count, uint8_t key, uint8_t *out) {
  return keyed_row<false>(in, count, key, out);
}

size_t BlendRowWithKey(const uint8_t *in, size_t count, uint8_t key, uint8_t *out) {
  return keyed_row<true>(in, count, key, out);
}

size_t MaskRow(const uint8_t *in, size_t count, uint8_t key, uint8_t *out) {
  return for_each_vector(
      in, out, count,
      [&](auto d, size_t i, const auto &load) {
        return hn::IfThenElseZero(hn::Ne(load(d, in + i), hn::Set(d, key)), hn::Set(d, 1));
      },
      EveryLane());
}

// Destination rows of a paste lie a raster row apart, too far for the hardware's prefetching to
// follow.
void PrefetchForWriting(uintptr_t at, size_t count) {
  constexpr uintptr_t kLine = 64;
  for (uintptr_t line = at & ~(kLine - 1); line < at + count; line += kLine) {
    __builtin_prefetch(reinterpret_cast<const void *>(line), 1, 3);
  }
}

// Whole vectors from the end while they hold no zero.
size_t NonzeroTail(const uint8_t *bytes, size_t count) {
  const D8 d;
  size_t end = count;
  while (end >= hn::Lanes(d) &&
         hn::AllFalse(d, hn::Eq(hn::LoadU(d, bytes + end - hn::Lanes(d)), hn::Zero(d)))) {
    end -= hn::Lanes(d);
  }
  return count - end;
}

#else
// The fallback target leaves every row to the plain bodies.
size_t BrightenRow(const uint8_t *, size_t, uint16_t, uint8_t *) {
  return 0;
}
size_t DarkenRow(const uint8_t *, size_t, uint16_t, uint8_t *) {
  return 0;
}
size_t CopyRow(const uint8_t *, size_t, uint8_t *) {
  return 0;
}
size_t BlendRow(const uint8_t *, size_t, uint8_t *) {
  return 0;
}
size_t PasteRowWithKey(const uint8_t *, size_t, uint8_t, uint8_t *) {
  return 0;
}
size_t BlendRowWithKey(const uint8_t *, size_t, uint8_t, uint8_t *) {
  return 0;
}
size_t MaskRow(const uint8_t *, size_t, uint8_t, uint8_t *) {
  return 0;
}
void PrefetchForWriting(uintptr_t, size_t) {}
size_t NonzeroTail(const uint8_t *, size_t) {
  return 0;
}
#endif  // KEL_PIXEL_OPS_VECTORS

}  // namespace HWY_NAMESPACE
}  // namespace simd
}  // namespace kel
HWY_AFTER_NAMESPACE();

#endif  // KEL_SIMD_PIXEL_OPS_INL_H_
