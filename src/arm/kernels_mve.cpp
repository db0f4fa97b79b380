// The hot rows on Helium (MVE: sixteen bytes in one vector register), for the Cortex-M55 and
// M85: compile-time entries of the kernel table where the target has it. Each does the whole
// vectors of its row, or declines the row, and returns the pixels done; the plain body finishes.
// Vector loads and stores take any alignment.
#include "kernels.h"

#if KEL_ARM_MVE
#include <arm_mve.h>

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

// min(pixel ^ key, 1): 0 exactly where the pixel is the key. (A compare's predicate would cost
// three more instructions: GCC 12 moves it through a general register and back.)
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

}  // namespace mve
}  // namespace kel

#endif  // KEL_ARM_MVE
