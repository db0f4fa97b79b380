// The hot rows on Helium (MVE: sixteen bytes in one vector register), for the Cortex-M55 and
// M85: compile-time entries of the kernel table where the target has it. Each does the whole
// vectors of its row, or declines the row, and returns the pixels done; the plain body finishes.
// Vector loads and stores take any alignment.
#include "kernels.h"

#if KEL_ARM_MVE
#include <arm_mve.h>

#include <cstdint>
#include <cstring>

namespace kel {
namespace mve {
namespace {

constexpr size_t kLanes = 16;

// The pixels of a row's whole vectors.
size_t whole_vectors(size_t count) {
  return count & ~(kLanes - 1);
}

uint32_t load_word(const uint8_t *at) {
  uint32_t word;
  std::memcpy(&word, at, sizeof word);
  return word;
}

}  // namespace

// Each loop runs from its first vector to `end`, pointers stepping sixteen bytes, and tests at
// its foot.

// min(pixel ^ key, 1): 0 exactly where the pixel is the key. (A compare's predicate costs more
// here: GCC 12 moves it through a general register and back.)
size_t mask(const uint8_t *in, size_t count, uint8_t key, uint8_t *out) {
  const size_t done = whole_vectors(count);
  if (done == 0) return 0;
  const uint8x16_t keys = vdupq_n_u8(key), ones = vdupq_n_u8(1);
  const uint8_t *const end = in + done;
  do {
    vst1q_u8(out, vminq_u8(veorq_u8(vld1q_u8(in), keys), ones));
    in += kLanes, out += kLanes;
  } while (in != end);
  return done;
}

size_t copy(const uint8_t *in, size_t count, uint8_t *out) {
  const size_t done = whole_vectors(count);
  if (done == 0) return 0;
  const uint8_t *const end = in + done;
  do {
    vst1q_u8(out, vld1q_u8(in));
    in += kLanes, out += kLanes;
  } while (in != end);
  return done;
}

size_t blend(const uint8_t *in, size_t count, uint8_t *out) {
  const size_t done = whole_vectors(count);
  if (done == 0) return 0;
  const uint8_t *const end = in + done;
  do {
    vst1q_u8(out, vhaddq_u8(vld1q_u8(out), vld1q_u8(in)));
    in += kLanes, out += kLanes;
  } while (in != end);
  return done;
}

// The keyed rows store only the lanes whose source pixel differs from the key.
size_t paste_keyed(const uint8_t *in, size_t count, uint8_t key, uint8_t *out) {
  const size_t done = whole_vectors(count);
  if (done == 0) return 0;
  const uint8_t *const end = in + done;
  do {
    const uint8x16_t pixels = vld1q_u8(in);
    vstrbq_p_u8(out, pixels, vcmpneq_n_u8(pixels, key));
    in += kLanes, out += kLanes;
  } while (in != end);
  return done;
}

size_t blend_keyed(const uint8_t *in, size_t count, uint8_t key, uint8_t *out) {
  const size_t done = whole_vectors(count);
  if (done == 0) return 0;
  const uint8_t *const end = in + done;
  do {
    const uint8x16_t pixels = vld1q_u8(in);
    vstrbq_p_u8(out, vhaddq_u8(vld1q_u8(out), pixels), vcmpneq_n_u8(pixels, key));
    in += kLanes, out += kLanes;
  } while (in != end);
  return done;
}

// Both sums across the vector into 32-bit scalars, which wrap modulo 2^32 like the plain ones.
size_t sum_pixels(const uint8_t *pixels, size_t count, PixelSums *sums) {
  const size_t done = whole_vectors(count);
  if (done == 0) return 0;
  uint32_t sum = sums->sum, sum_of_squares = sums->sum_of_squares;
  const uint8_t *const end = pixels + done;
  do {
    const uint8x16_t values = vld1q_u8(pixels);
    sum = vaddvaq_u8(sum, values);
    sum_of_squares = vmladavaq_u8(sum_of_squares, values, values);
    pixels += kLanes;
  } while (pixels != end);
  *sums = PixelSums{sum, sum_of_squares};
  return done;
}

// Lanes cannot add into bins without those that hit the same bin losing counts, so the bins are
// counted in scalar code, two words of four pixels a turn: each byte's bin taken in one
// instruction (a byte extract for all 256 bins; for fewer, a mask of the word shifted down once
// so that each byte's top bits sit at its foot, the neighbouring byte's bits above the mask),
// then its count read, raised and written back.
namespace {

// Adds the four pixels of a word to their bins, each byte taken whole (bits 8).
KEL_ALWAYS_INLINE void count_word(uint32_t word, uint32_t *hist) {
  ++hist[word & 0xFF], ++hist[(word >> 8) & 0xFF], ++hist[(word >> 16) & 0xFF], ++hist[word >> 24];
}

}  // namespace

size_t count_bins(const uint8_t *pixels, size_t count, uint32_t bits, uint32_t *hist) {
  // Counted down, so that the loops are the core's own (dls/le), one instruction a turn.
  if (bits == 8) {
    // Four words a turn: one pointer step for sixteen pixels.
    const size_t done = count & ~size_t{15};
    if (done == 0) return 0;
    size_t turns = done / 16;
    do {
      count_word(load_word(pixels), hist), count_word(load_word(pixels + 4), hist);
      count_word(load_word(pixels + 8), hist), count_word(load_word(pixels + 12), hist);
      pixels += 16;
    } while (--turns != 0);
    return done;
  }
  const size_t done = count & ~size_t{7};
  if (done == 0) return 0;
  const uint32_t shift = 8 - bits, top = 0xFFu >> shift;
  size_t turns = done / 8;
  do {
    const uint32_t low = load_word(pixels) >> shift, high = load_word(pixels + 4) >> shift;
    ++hist[low & top], ++hist[(low >> 8) & top], ++hist[(low >> 16) & top], ++hist[low >> 24];
    ++hist[high & top], ++hist[(high >> 8) & top], ++hist[(high >> 16) & top], ++hist[high >> 24];
    pixels += 8;
  } while (--turns != 0);
  return done;
}

namespace {

// A point operation through a table of its 256 results, made by its own plain body, and read
// sixteen pixels at a time by a gathering load. Rows too short to pay for the table are declined.
using PointRow = size_t (*)(const uint8_t *in, size_t count, uint16_t percent, uint8_t *out);

size_t through_table(PointRow plain_body, const uint8_t *in, size_t count, uint16_t percent,
                     uint8_t *out) {
  constexpr size_t kShortest = 256;
  const size_t done = whole_vectors(count);
  if (done < kShortest) return 0;
  uint8_t table[256];
  for (size_t v = 0; v < sizeof table; ++v) table[v] = static_cast<uint8_t>(v);
  plain_body(table, sizeof table, percent, table);
  const uint8_t *const end = in + done;
  do {
    vst1q_u8(out, vldrbq_gather_offset_u8(table, vld1q_u8(in)));
    in += kLanes, out += kLanes;
  } while (in != end);
  return done;
}

}  // namespace

size_t brighten(const uint8_t *in, size_t count, uint16_t percent, uint8_t *out) {
  return through_table(plain::brighten, in, count, percent, out);
}

size_t darken(const uint8_t *in, size_t count, uint16_t percent, uint8_t *out) {
  return through_table(plain::darken, in, count, percent, out);
}

// ---- Rotation runs, four canvas pixels a turn
// ----------------------------------------------------
//
// Each lane holds one canvas pixel's source position, in 32 bits: runs whose positions do not fit
// are declined. The neighbours come in by gathering loads. The bilinear total
// ay * top + fy * bottom reaches 255 * 2^28, past 32 bits, so it is taken in two parts that do
// not: with top and bottom the rows' interpolations (below 2^22) and d = bottom - top split as
// dh * 2^14 + dl (dl in [0, 2^14)), total = 2^14 * (top + fy * dh) + fy * dl, and
// floor(total / 2^28) = floor(e / 2^14) for e = top + fy * dh + floor(fy * dl / 2^14).

namespace {

constexpr int32_t kFractionMask = (1 << 14) - 1;

// The lanes' positions along one axis, and whether the run's fit 32 bits.
bool lane_positions(int64_t first, int32_t step, size_t count, int32x4_t &lanes) {
  const int64_t last = first + step * static_cast<int64_t>(count - 1);
  if (first < 0 || last < 0 || first > INT32_MAX || last > INT32_MAX) return false;
  lanes = vmlaq_n_s32(vdupq_n_s32(static_cast<int32_t>(first)),
                      vreinterpretq_s32_u32(vidupq_n_u32(0, 1)), step);
  return true;
}

// Walks a run four pixels a turn: at(offsets, fx, fy) resamples the lanes whose whole parts give
// the buffer offsets; returns the pixels done.
template <typename Resample>
KEL_ALWAYS_INLINE size_t walk_run(const RotationRun &run, Resample resample) {
  const size_t done = run.count & ~size_t{3};
  int32x4_t x, y;
  if (done == 0 || !lane_positions(run.x, run.step_x, run.count, x) ||
      !lane_positions(run.y, run.step_y, run.count, y)) {
    return 0;
  }
  const auto width = static_cast<uint32_t>(run.width);
  for (size_t i = 0; i < done; i += 4) {
    // Positions are never negative, so the shifts are the whole parts.
    const uint32x4_t offsets = vmlaq_n_u32(vreinterpretq_u32_s32(vshrq_n_s32(x, 14)),
                                           vreinterpretq_u32_s32(vshrq_n_s32(y, 14)), width);
    resample(i, offsets, vandq_s32(x, vdupq_n_s32(kFractionMask)),
             vandq_s32(y, vdupq_n_s32(kFractionMask)));
    x = vaddq_n_s32(x, 4 * run.step_x);
    y = vaddq_n_s32(y, 4 * run.step_y);
  }
  return done;
}

// One row's interpolation: near * 2^14 + f * (far - near).
KEL_ALWAYS_INLINE int32x4_t between(int32x4_t near, int32x4_t far, int32x4_t f) {
  return vaddq_s32(vshlq_n_s32(near, 14), vmulq_s32(f, vsubq_s32(far, near)));
}

// e = floor(total / 2^14), as above.
KEL_ALWAYS_INLINE int32x4_t total_over_2_14(int32x4_t top, int32x4_t bottom, int32x4_t fy,
                                            int32x4_t &low) {
  const int32x4_t d = vsubq_s32(bottom, top);
  low = vmulq_s32(fy, vandq_s32(d, vdupq_n_s32(kFractionMask)));
  return vaddq_s32(vaddq_s32(top, vmulq_s32(fy, vshrq_n_s32(d, 14))), vshrq_n_s32(low, 14));
}

}  // namespace

size_t rotate_u8(const RotationRun &run, uint8_t *out) {
  const auto *src = static_cast<const uint8_t *>(run.src);
  const auto width = static_cast<size_t>(run.width);
  return walk_run(run, [&](size_t i, uint32x4_t at, int32x4_t fx, int32x4_t fy) {
    const auto pixel = [&](size_t offset) {
      return vreinterpretq_s32_u32(vldrbq_gather_offset_u32(src + offset, at));
    };
    const int32x4_t top = between(pixel(0), pixel(1), fx);
    const int32x4_t bottom = between(pixel(width), pixel(width + 1), fx);
    int32x4_t low;
    vstrbq_s32(reinterpret_cast<int8_t *>(out + i),
               vshrq_n_s32(total_over_2_14(top, bottom, fy, low), 14));
  });
}

// The signed total truncated toward zero: a negative one is first raised by 2^28 - 1, which
// raises e by 2^14 - 1, and by one more when the part below e's unit, fy * dl mod 2^14, is not 0.
size_t rotate_i8(const RotationRun &run, int8_t *out) {
  const auto *src = static_cast<const int8_t *>(run.src);
  const auto width = static_cast<size_t>(run.width);
  return walk_run(run, [&](size_t i, uint32x4_t at, int32x4_t fx, int32x4_t fy) {
    const auto pixel = [&](size_t offset) { return vldrbq_gather_offset_s32(src + offset, at); };
    const int32x4_t top = between(pixel(0), pixel(1), fx);
    const int32x4_t bottom = between(pixel(width), pixel(width + 1), fx);
    int32x4_t low;
    const int32x4_t e = total_over_2_14(top, bottom, fy, low);
    const uint32x4_t rest_carries = vminq_u32(
        vreinterpretq_u32_s32(vandq_s32(low, vdupq_n_s32(kFractionMask))), vdupq_n_u32(1));
    const int32x4_t raise =
        vandq_s32(vshrq_n_s32(e, 31),
                  vaddq_s32(vdupq_n_s32(kFractionMask), vreinterpretq_s32_u32(rest_carries)));
    vstrbq_s32(out + i, vshrq_n_s32(vaddq_s32(e, raise), 14));
  });
}

// -128 marks the uncovered canvas pixels, so a covered -128 becomes -127: the lanes' maximum
// with -127.
size_t rotate_i8_nn(const RotationRun &run, int8_t *out) {
  const auto *src = static_cast<const int8_t *>(run.src);
  return walk_run(run, [&](size_t i, uint32x4_t at, int32x4_t, int32x4_t) {
    vstrbq_s32(out + i, vmaxq_s32(vldrbq_gather_offset_s32(src, at), vdupq_n_s32(-127)));
  });
}

}  // namespace mve
}  // namespace kel

#endif  // KEL_ARM_MVE
