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
