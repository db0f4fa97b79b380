// The hot rows on the Arm DSP extension (SIMD32: four bytes in one 32-bit register), for the
// Cortex-M4, M7, M33 and M55: compile-time entries of the kernel table where the target has it.
// Each does the whole words of its row, or declines the row, and returns the pixels done; the
// plain body finishes. Words are read and written with plain loads and stores, which these cores
// take at any alignment.
//
// The per-byte compares go through the GE flags: usub8 of (pixel ^ key) and 0x01010101 sets a
// byte's flag exactly where the pixel differs from the key, and sel then takes that byte from its
// first operand, the rest from its second.
#include "kernels.h"

#if KEL_ARM_DSP
#include <arm_acle.h>

#include <cstring>

namespace kel {
namespace dsp {
namespace {

constexpr uint32_t kOnes = 0x01010101u;

uint32_t load(const uint8_t *at) {
  uint32_t word;
  std::memcpy(&word, at, sizeof word);
  return word;
}

void store(uint8_t *at, uint32_t word) {
  std::memcpy(at, &word, sizeof word);
}

// The pixels of a row's whole words.
size_t whole_words(size_t count) {
  return count & ~size_t{3};
}

// Sets each byte's GE flag where the byte of `pixels` differs from the key's (keys = key * kOnes).
void flag_other_than(uint32_t pixels, uint32_t keys) {
  __usub8(pixels ^ keys, kOnes);
}

}  // namespace

// Each loop runs from its first word to `end`, pointers stepping four bytes, and tests at its
// foot: a compare and a branch per word, which is all the loop costs.

size_t mask(const uint8_t *in, size_t count, uint8_t key, uint8_t *out) {
  const size_t done = whole_words(count);
  if (done == 0) return 0;
  const uint32_t keys = key * kOnes;
  const uint8_t *const end = in + done;
  do {
    flag_other_than(load(in), keys);
    store(out, __sel(kOnes, 0));
    in += 4, out += 4;
  } while (in != end);
  return done;
}

// Sixteen bytes a turn in four words, loaded before any is stored, between word-aligned rows
// (the loads and stores of two words at once need that); other rows are declined.
size_t copy(const uint8_t *in, size_t count, uint8_t *out) {
  const size_t done = count & ~size_t{15};
  if (done == 0 || ((reinterpret_cast<uintptr_t>(in) | reinterpret_cast<uintptr_t>(out)) & 3) != 0)
    return 0;
  const uint8_t *const end = in + done;
  do {
    const auto *from = static_cast<const uint8_t *>(__builtin_assume_aligned(in, 4));
    auto *to = static_cast<uint8_t *>(__builtin_assume_aligned(out, 4));
    const uint32_t a = load(from), b = load(from + 4), c = load(from + 8), d = load(from + 12);
    store(to, a), store(to + 4, b), store(to + 8, c), store(to + 12, d);
    in += 16, out += 16;
  } while (in != end);
  return done;
}

size_t blend(const uint8_t *in, size_t count, uint8_t *out) {
  const size_t done = whole_words(count);
  if (done == 0) return 0;
  const uint8_t *const end = in + done;
  do {
    store(out, __uhadd8(load(out), load(in)));
    in += 4, out += 4;
  } while (in != end);
  return done;
}

size_t paste_keyed(const uint8_t *in, size_t count, uint8_t key, uint8_t *out) {
  const size_t done = whole_words(count);
  if (done == 0) return 0;
  const uint32_t keys = key * kOnes;
  const uint8_t *const end = in + done;
  do {
    const uint32_t pixels = load(in);
    flag_other_than(pixels, keys);
    store(out, __sel(pixels, load(out)));
    in += 4, out += 4;
  } while (in != end);
  return done;
}

size_t blend_keyed(const uint8_t *in, size_t count, uint8_t key, uint8_t *out) {
  const size_t done = whole_words(count);
  if (done == 0) return 0;
  const uint32_t keys = key * kOnes;
  const uint8_t *const end = in + done;
  do {
    const uint32_t pixels = load(in), under = load(out);
    flag_other_than(pixels, keys);
    // uhadd8 leaves the GE flags as usub8 set them.
    store(out, __sel(__uhadd8(under, pixels), under));
    in += 4, out += 4;
  } while (in != end);
  return done;
}

// usada8 adds the four bytes; uxtb16 spreads bytes 0 and 2 (then 1 and 3) into halfwords, and
// smlad adds both halfwords' squares. Both sums wrap modulo 2^32 like the plain ones.
size_t sum_pixels(const uint8_t *pixels, size_t count, PixelSums *sums) {
  const size_t done = whole_words(count);
  if (done == 0) return 0;
  uint32_t sum = sums->sum, sum_of_squares = sums->sum_of_squares;
  const uint8_t *const end = pixels + done;
  do {
    const uint32_t word = load(pixels);
    const uint32_t even = __uxtb16(word), odd = __uxtb16(word >> 8);
    sum = __usada8(word, 0, sum);
    sum_of_squares =
        static_cast<uint32_t>(__smlad(even, even, static_cast<int32_t>(sum_of_squares)));
    sum_of_squares = static_cast<uint32_t>(__smlad(odd, odd, static_cast<int32_t>(sum_of_squares)));
    pixels += 4;
  } while (pixels != end);
  *sums = PixelSums{sum, sum_of_squares};
  return done;
}

namespace {

// A point operation through a table of its 256 results, made by its own plain body, eight pixels
// a turn. Rows too short to pay for the table are declined.
using PointRow = size_t (*)(const uint8_t *in, size_t count, uint16_t percent, uint8_t *out);

size_t through_table(PointRow plain_body, const uint8_t *in, size_t count, uint16_t percent,
                     uint8_t *out) {
  constexpr size_t kShortest = 256;
  const size_t done = count & ~size_t{7};
  if (done < kShortest) return 0;
  uint8_t table[256];
  for (uint32_t v = 0; v < sizeof table; v += 4) store(table + v, 0x03020100u + v * kOnes);
  plain_body(table, sizeof table, percent, table);
  const uint8_t *const end = in + done;
  do {
    // Written out: builds for size would keep an inner loop.
    out[0] = table[in[0]], out[1] = table[in[1]], out[2] = table[in[2]], out[3] = table[in[3]];
    out[4] = table[in[4]], out[5] = table[in[5]], out[6] = table[in[6]], out[7] = table[in[7]];
    in += 8, out += 8;
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

}  // namespace dsp
}  // namespace kel

#endif  // KEL_ARM_DSP
