// Our default smoothing and bilinear enlargement, the two image functions the masked fill
// calls outside the library. Both work without heap and with a small, fixed amount of stack.
//
// Every row loop is a kernel of the table in image_filters_simd.h. The plain bodies here are the
// reference and finish every row; they are written so that GCC's vectoriser (-O3, as in the
// Release build) turns them into vector code on its own, 8-bit averages for the blur and 16-bit
// lanes for the enlargement, with SSE2 on any x86-64 and NEON on aarch64. With Highway,
// image_filters_simd.cpp has variants for wider instruction sets, chosen at run time. Every
// build runs the same drivers on the same bodies, so none of them computes a different result.
#include <cstddef>
#include <cstdint>
#include <cstring>

#include "image_filters_simd.h"
#include "kel_outside.h"

// A build for size (MinSizeRel, as for microcontrollers) keeps shorter strips on the stack, so
// that the masked fill, which calls these under its own frame, stays within a small stack. A
// strip's length bounds the stack a call takes, never what it computes: every pixel of a strip
// is found from the same neighbours whatever its length.
#if KEL_SMALL_BUILD
constexpr bool kSmallBuild = true;
#else
constexpr bool kSmallBuild = false;
#endif

namespace kel {
namespace outside {
namespace {

size_t strip_length(size_t start, size_t total, size_t strip) {
  return total - start < strip ? total - start : strip;
}

// ---------------------------------------------------------------------------------------------
// Blur: [1 2 1] / 4 along the rows, then along the columns, edges clamped.
// ---------------------------------------------------------------------------------------------

// Columns handled at a time where the in-place blur keeps a copy of its input on the stack.
constexpr size_t kBlurStrip = kSmallBuild ? 128 : 256;

// (a + 2b + c + 2) >> 2: each pass rounds half up, so a constant raster stays constant. It is
// taken as two 8-bit averages, which vector units do in one instruction each. With
// a + c = 2m + r (r is 0 or 1) the sum is 2(m + b + 1) + r, and r / 4 added to (m + b + 1) / 2
// never reaches the next whole number, so the result is the rounded-up average of m and b; m,
// the rounded-down average of a and c, is their rounded-up one less the odd bit it dropped.
uint8_t smooth(uint8_t before, uint8_t centre, uint8_t after) {
  const auto outer_up = static_cast<uint8_t>((unsigned{before} + after + 1) >> 1);
  const auto outer = static_cast<uint8_t>(outer_up - ((before ^ after) & 1));
  return static_cast<uint8_t>((unsigned{outer} + centre + 1) >> 1);
}

}  // namespace

namespace plain {

size_t smooth_triples(const uint8_t *src, size_t count, uint8_t *dst) {
  for (size_t i = 0; i < count; ++i) dst[i] = smooth(src[i], src[i + 1], src[i + 2]);
  return count;
}

// Both passes of one row: the horizontal pass of `row` goes to `lower`, and the vertical pass
// of `centre`'s column turns `upper` (the pass of the row above) into the result; each column
// needs its own three values only.
size_t smooth_across_and_down(const uint8_t *row, size_t count, uint8_t *upper,
                              const uint8_t *centre, uint8_t *lower) {
  for (size_t i = 0; i < count; ++i) {
    const uint8_t across = smooth(row[i], row[i + 1], row[i + 2]);
    lower[i] = across;
    upper[i] = smooth(upper[i], centre[i], across);
  }
  return count;
}

// The vertical pass in place: `above` holds the original row above and takes this row's.
size_t smooth_down_carrying(uint8_t *above, uint8_t *row, const uint8_t *below, size_t count) {
  for (size_t i = 0; i < count; ++i) {
    const uint8_t centre = row[i];
    row[i] = smooth(above[i], centre, below[i]);
    above[i] = centre;
  }
  return count;
}

}  // namespace plain

namespace {

#if defined(__GNUC__)
#define KEL_ALWAYS_INLINE inline __attribute__((always_inline))
#else
#define KEL_ALWAYS_INLINE inline
#endif

// Whether `best` has a variant of its own for `entry`. The plain table has none, and there the
// plain body does the whole row in one call; where the table is known when compiling, the test
// goes away with the call to the variant, so a firmware's drivers call each body once.
template <typename Entry>
KEL_ALWAYS_INLINE bool has_variant(const FilterKernels &best, Entry FilterKernels::*entry) {
  return best.*entry != kPlainFilterKernels.*entry;
}

// The rows on the `best` table: its variant does the whole vectors from the start of the row, the
// plain body the rest, unless the variant left nothing (many short rows make up a call, and each
// would otherwise pay a call that does no pixel). Always inlined, so that where the table is
// known when compiling each driver calls its plain bodies directly.
namespace rows {

KEL_ALWAYS_INLINE void smooth_triples(const FilterKernels &best, const uint8_t *src, size_t count,
                                      uint8_t *dst) {
  size_t done = 0;
  if (has_variant(best, &FilterKernels::smooth_triples)) {
    done = best.smooth_triples(src, count, dst);
    if (done == count) return;
  }
  plain::smooth_triples(src + done, count - done, dst + done);
}

KEL_ALWAYS_INLINE void smooth_across_and_down(const FilterKernels &best, const uint8_t *row,
                                              size_t count, uint8_t *upper, const uint8_t *centre,
                                              uint8_t *lower) {
  size_t done = 0;
  if (has_variant(best, &FilterKernels::smooth_across_and_down)) {
    done = best.smooth_across_and_down(row, count, upper, centre, lower);
    if (done == count) return;
  }
  plain::smooth_across_and_down(row + done, count - done, upper + done, centre + done,
                                lower + done);
}

KEL_ALWAYS_INLINE void smooth_down_carrying(const FilterKernels &best, uint8_t *above, uint8_t *row,
                                            const uint8_t *below, size_t count) {
  size_t done = 0;
  if (has_variant(best, &FilterKernels::smooth_down_carrying)) {
    done = best.smooth_down_carrying(above, row, below, count);
    if (done == count) return;
  }
  plain::smooth_down_carrying(above + done, row + done, below + done, count - done);
}

KEL_ALWAYS_INLINE void blend_spread(const FilterKernels &best, const uint8_t *spread,
                                    const uint8_t *odd, size_t count, uint16_t *pairs) {
  size_t done = 0;
  if (has_variant(best, &FilterKernels::blend_spread)) {
    done = best.blend_spread(spread, odd, count, pairs);
    if (done == count) return;
  }
  plain::blend_spread(spread + done, odd + done, count - done, pairs + done);
}

KEL_ALWAYS_INLINE void mix_eight_rows(const FilterKernels &best, const uint16_t *upper,
                                      const uint16_t *lower, size_t count, uint8_t *out,
                                      size_t stride) {
  size_t done = 0;
  if (has_variant(best, &FilterKernels::mix_eight_rows)) {
    done = best.mix_eight_rows(upper, lower, count, out, stride);
    if (done == count) return;
  }
  plain::mix_eight_rows(upper + done, lower + done, count - done, out + done, stride);
}

KEL_ALWAYS_INLINE void blend_rows_coarse(const FilterKernels &best, const uint16_t *top,
                                         const uint16_t *bottom, uint32_t weight_bottom,
                                         size_t count, uint8_t *out) {
  size_t done = 0;
  if (has_variant(best, &FilterKernels::blend_rows_coarse)) {
    done = best.blend_rows_coarse(top, bottom, weight_bottom, count, out);
    if (done == count) return;
  }
  plain::blend_rows_coarse(top + done, bottom + done, weight_bottom, count - done, out + done);
}

}  // namespace rows

// The horizontal pass at column x of a row; the first and last columns are their own outer
// neighbours.
uint8_t across_at(const uint8_t *row, size_t width, size_t x) {
  return smooth(row[x > 0 ? x - 1 : 0], row[x], row[x + 1 < width ? x + 1 : x]);
}

// From `in` into a separate `out`, both passes in one sweep down the image, so that every row
// is read once from memory and the rows in use stay in the cache. The horizontal pass of input
// row k is kept in output row k + 1 until that row is written: output row k + 1 is its last
// reader, and as each output pixel needs only the passes in its own column, the output row can
// replace the pass it reads pixel by pixel. The columns between the first and the last go to the
// table's rows, the two edge columns around them.
void blur_apart(const FilterKernels &best, const uint8_t *in, size_t height, size_t width,
                uint8_t *out) {
  const size_t last = width - 1;
  const size_t inner = width > 2 ? width - 2 : 0;  // the columns with both neighbours in the row
  out[0] = across_at(in, width, 0);
  out[last] = across_at(in, width, last);
  rows::smooth_triples(best, in, inner, out + 1);
  if (height == 1) return;               // the row is its own upper and lower neighbour
  std::memcpy(out + width, out, width);  // row 0 is its own upper neighbour
  for (size_t y = 0; y + 2 < height; ++y) {
    uint8_t *const upper = out + y * width;
    uint8_t *const lower = upper + 2 * width;
    const uint8_t *const row = in + (y + 1) * width;
    rows::smooth_across_and_down(best, row, inner, upper + 1, upper + width + 1, lower + 1);
    // The first and last columns, both found before either is stored: in a row of one pixel
    // they are the same column.
    const uint8_t first_across = across_at(row, width, 0);
    const uint8_t last_across = across_at(row, width, last);
    const uint8_t first_out = smooth(upper[0], upper[width], first_across);
    const uint8_t last_out = smooth(upper[last], upper[width + last], last_across);
    lower[0] = first_across;
    lower[last] = last_across;
    upper[0] = first_out;
    upper[last] = last_out;
  }
  // The last input row has no output row to wait in: its pass finishes both last output rows,
  // the last one being its own lower neighbour. It is one row of the image, taken pixel by pixel
  // in one loop with the edges clamped.
  uint8_t *const upper = out + (height - 2) * width;
  uint8_t *const lower = upper + width;
  const uint8_t *const row = in + (height - 1) * width;
  for (size_t x = 0; x < width; ++x) {
    const uint8_t across = across_at(row, width, x);
    const uint8_t centre = lower[x];
    upper[x] = smooth(upper[x], centre, across);
    lower[x] = smooth(centre, across, across);
  }
}

// In place: the horizontal pass row by row, each strip copied to the stack before it is
// overwritten, its last original byte carried on as the next strip's left neighbour; then the
// vertical pass strip by strip down the columns, the original row above carried on the stack.
void blur_in_place(const FilterKernels &best, uint8_t *pixels, size_t height, size_t width) {
  // The strip's copy starts on an 8-byte boundary, its left neighbour in the byte before: GCC
  // copies a strip of bounded length with 8-byte moves, far slower to an address off it.
  alignas(8) uint8_t window[8 + kBlurStrip + 1];
  uint8_t *const strip = window + 8;
  for (size_t y = 0; y < height; ++y) {
    uint8_t *row = pixels + y * width;
    uint8_t left = row[0];
    for (size_t start = 0; start < width; start += kBlurStrip) {
      const size_t count = strip_length(start, width, kBlurStrip);
      strip[-1] = left;
      std::memcpy(strip, row + start, count);
      // The bytes after the strip are not written yet; past the last column the edge repeats.
      strip[count] = row[start + count < width ? start + count : width - 1];
      left = strip[count - 1];
      rows::smooth_triples(best, strip - 1, count, row + start);
    }
  }
  uint8_t above[kBlurStrip];
  for (size_t start = 0; start < width; start += kBlurStrip) {
    const size_t count = strip_length(start, width, kBlurStrip);
    std::memcpy(above, pixels + start, count);  // the first row is its own upper neighbour
    for (size_t y = 0; y < height; ++y) {
      uint8_t *const row = pixels + y * width + start;
      // The last row is its own lower neighbour: row[i] is read below before it is written.
      const uint8_t *const below = y + 1 < height ? row + width : row;
      rows::smooth_down_carrying(best, above, row, below, count);
    }
  }
}

// ---------------------------------------------------------------------------------------------
// Bilinear enlargement by an integer factor.
// ---------------------------------------------------------------------------------------------

// Output columns handled at a time: 6 bytes of sample position and 4 of blended input rows
// each, on the stack.
constexpr size_t kScaleStrip = kSmallBuild ? 32 : 256;

// The two input samples an output pixel lies between, and the weight of the second one in
// 1/256 units (0 .. 255).
struct Tap {
  uint16_t first;
  uint16_t second;
  uint16_t weight_second;
};

// Sample centres are aligned: the centre of output pixel i lies at input position
// (i + 1/2) / factor - 1/2, which times 2 * factor is the integer 2i + 1 - factor. Positions
// before the first sample or after the last take that sample alone, so output beyond
// input * factor repeats the edge. The weight is rounded down to 8 fraction bits.
Tap locate(uint32_t out_index, uint32_t factor, uint32_t in_size) {
  // Index and factor are below 2^16, so every quantity here fits 32 bits, fraction << 8 too.
  if (2 * out_index + 1 <= factor) return Tap{0, 0, 0};
  const uint32_t scaled = 2 * out_index + 1 - factor;
  const uint32_t span = 2 * factor;
  const uint16_t last = static_cast<uint16_t>(in_size - 1);
  const uint32_t first = scaled / span;
  if (first >= last) return Tap{last, last, 0};
  const uint32_t fraction = scaled - first * span;
  return Tap{static_cast<uint16_t>(first), static_cast<uint16_t>(first + 1),
             static_cast<uint16_t>((fraction << 8) / span)};
}

// Both weights carry 8 fraction bits, so the total carries 16 and is rounded half up; with
// 255 * 2^16 at most it fits 32 bits. The total is an exact sum of four products, so any order of
// adding them gives the same bits: the input rows are first blended along the columns, once per
// input row and strip, and each output row then only mixes two such blended rows with one
// vertical weight, a loop without lookups that vectorises.
uint16_t blend_columns(const uint8_t *row, Tap column) {
  return static_cast<uint16_t>(row[column.first] * (256u - column.weight_second) +
                               row[column.second] * uint32_t{column.weight_second});
}

// `shift` drops low bits that are known to be 0 (see blend_rows_coarse).
void blend_row_of_columns(const uint8_t *row, const Tap *columns, size_t count, unsigned shift,
                          uint16_t *out) {
  for (size_t i = 0; i < count; ++i)
    out[i] = static_cast<uint16_t>(blend_columns(row, columns[i]) >> shift);
}

void blend_rows(const uint16_t *top, const uint16_t *bottom, uint32_t weight_bottom, size_t count,
                uint8_t *out) {
  const uint32_t weight_top = 256 - weight_bottom;
  for (size_t i = 0; i < count; ++i) {
    const uint32_t total = top[i] * weight_top + bottom[i] * weight_bottom;
    out[i] = static_cast<uint8_t>((total + 32768u) >> 16);
  }
}

// When the factor divides 8, every weight is a whole multiple of 16 (fraction * 128 / factor,
// the fraction odd or 0), so the blended rows were stored divided by 16 (at most 4080) and the
// total is 256 times a sum below 2^16: the same bits in 16-bit lanes, twice as many per vector.
constexpr unsigned kCoarseShift = 4;

bool weights_are_coarse(uint16_t factor) {
  return factor != 0 && 8 % factor == 0;
}

}  // namespace

namespace plain {

size_t blend_rows_coarse(const uint16_t *top, const uint16_t *bottom, uint32_t weight_bottom,
                         size_t count, uint8_t *out) {
  const auto bottom_part = static_cast<uint16_t>(weight_bottom >> kCoarseShift);
  const auto top_part = static_cast<uint16_t>(16 - bottom_part);
  for (size_t i = 0; i < count; ++i) {
    const auto total = static_cast<uint16_t>(top[i] * top_part + bottom[i] * bottom_part + 128);
    out[i] = static_cast<uint8_t>(total >> 8);
  }
  return count;
}

}  // namespace plain

namespace {

// Any factor, strip by strip: the sample positions of a strip's columns are found once, and
// each input row is blended along them once for all the output rows between it and its
// neighbours.
void scale_up_any(const FilterKernels &best, const uint8_t *in, uint16_t in_height,
                  uint16_t in_width, uint16_t factor, uint8_t *out, uint16_t out_height,
                  uint16_t out_width) {
  const bool coarse = weights_are_coarse(factor);
  const unsigned shift = coarse ? kCoarseShift : 0;
  Tap columns[kScaleStrip];
  uint16_t blended[2][kScaleStrip];
  for (size_t start = 0; start < out_width; start += kScaleStrip) {
    const size_t count = strip_length(start, out_width, kScaleStrip);
    for (size_t i = 0; i < count; ++i) {
      columns[i] = locate(static_cast<uint32_t>(start + i), factor, in_width);
    }
    uint16_t *top = blended[0];
    uint16_t *bottom = blended[1];
    // Input rows lie below 65535, so at the start no row is held.
    Tap rows_held{UINT16_MAX, UINT16_MAX, 0};
    for (size_t y = 0; y < out_height; ++y) {
      const Tap row = locate(static_cast<uint32_t>(y), factor, in_height);
      if (row.first != rows_held.first || row.second != rows_held.second) {
        if (row.first == rows_held.second) {
          uint16_t *const reused = bottom;  // moving down one input row: the bottom becomes top
          bottom = top;
          top = reused;
        } else {
          blend_row_of_columns(in + size_t{row.first} * in_width, columns, count, shift, top);
        }
        blend_row_of_columns(in + size_t{row.second} * in_width, columns, count, shift, bottom);
        rows_held = row;
      }
      uint8_t *out_row = out + y * out_width + start;
      if (coarse) {
        rows::blend_rows_coarse(best, top, bottom, row.weight_second, count, out_row);
      } else {
        blend_rows(top, bottom, row.weight_second, count, out_row);
      }
    }
  }
}

// ---- The factor 8 of the masked fill ----------------------------------------------------------
//
// With the factor 8, output pixel 8k + j lies between input samples k - 1 and k for j < 4 and
// between k and k + 1 for j >= 4, 2j + 9 and 2j - 7 sixteenths from the first; weights in
// sixteenths are exact in 1/256 units, so the coarse arithmetic above applies. Along a row the
// blended value is therefore a fixed mix of three clamped neighbours per pixel of each 8-pixel
// run, and down the columns the eight output rows between two input rows take 1, 3, .., 15
// sixteenths of the lower one: a sum that grows by the same step from row to row.

// Output columns handled at a time: two blended rows of 2 bytes per column and the row's samples
// spread over a byte per column, on the stack.
constexpr size_t kScale8Strip = kSmallBuild ? 64 : 256;

// One input row blended along the columns, in sixteenths (at most 4080): the 8 output columns
// 8k + 4 .. 8k + 11 take 16 s[k] + (2j + 1) (s[k + 1] - s[k]), j = 0 .. 7, from the samples
// s of the row, clamped at both ends (where the difference is then 0). `pairs` holds that for
// k = first_run - 1 .. first_run + runs - 1, so output column 8 * first_run + i is pairs[i + 4].
// Each sample is first spread over 8 bytes, so that the blend reads its two samples at fixed
// distances with weights that repeat every 8 columns.
void blend_row_by_8(const FilterKernels &best, const uint8_t *row, size_t width, size_t first_run,
                    size_t runs, const uint8_t *odd, uint16_t *pairs) {
  uint8_t spread[kScale8Strip + 16];  // samples first_run - 1 .. first_run + runs, 8 times each
  for (size_t i = 0; i < runs + 2; ++i) {
    // Spread run i holds sample first_run - 1 + i, clamped to the row: k is one past it.
    const size_t k = first_run + i;
    std::memset(spread + 8 * i, row[k == 0 ? 0 : (k < width ? k : width) - 1], 8);
  }
  rows::blend_spread(best, spread, odd, 8 * (runs + 1), pairs);
}

}  // namespace

namespace plain {

size_t blend_spread(const uint8_t *spread, const uint8_t *odd, size_t count, uint16_t *pairs) {
  for (size_t x = 0; x < count; ++x) {
    pairs[x] = static_cast<uint16_t>(16 * spread[x] + odd[x] * (spread[x + 8] - spread[x]));
  }
  return count;
}

// The rows a loop writes lie apart, which the compiler cannot know; GCC otherwise compares every
// pair of them at run time, gives up beyond ten pairs and leaves the loop scalar.
#if defined(__GNUC__) && !defined(__clang__)
#define KEL_ROWS_LIE_APART _Pragma("GCC ivdep")
#else
#define KEL_ROWS_LIE_APART
#endif

// The eight output rows between two input rows (1, 3, .., 15 sixteenths of the lower one). The
// total is 16 * upper + 128 + (2j + 1) * (lower - upper); taken modulo 2^16 it stays exact,
// since the true total fits 16 bits.
size_t mix_eight_rows(const uint16_t *upper, const uint16_t *lower, size_t count, uint8_t *out,
                      size_t stride) {
  KEL_ROWS_LIE_APART
  for (size_t i = 0; i < count; ++i) {
    const int difference = lower[i] - upper[i];
    auto total = static_cast<uint16_t>(16 * upper[i] + 128 + difference);
    const auto step = static_cast<uint16_t>(2 * difference);
    for (size_t j = 0; j < 8; ++j) {
      out[j * stride + i] = static_cast<uint8_t>(total >> 8);
      total = static_cast<uint16_t>(total + step);
    }
  }
  return count;
}

}  // namespace plain

namespace {

void scale_up_by_8(const FilterKernels &best, const uint8_t *in, size_t in_height, size_t in_width,
                   uint8_t *out, size_t out_height, size_t out_width) {
  uint16_t pairs[2][kScale8Strip + 8];
  uint8_t odd[kScale8Strip + 8];  // 2j + 1 for column 8q + j
  for (size_t x = 0; x < kScale8Strip + 8; ++x) odd[x] = static_cast<uint8_t>(2 * (x % 8) + 1);
  for (size_t start = 0; start < out_width; start += kScale8Strip) {
    const size_t count = strip_length(start, out_width, kScale8Strip);
    const size_t runs = (count + 7) / 8;
    // Output rows 8u + 4 .. 8u + 11 lie between input rows u and u + 1, both clamped: band
    // u + 1 of the loop below. Rows 0 .. 3 lie between row 0 and itself (u = -1, band 0).
    const size_t last_in = in_height - 1;
    uint16_t *const blended[2] = {pairs[0] + 4, pairs[1] + 4};  // from output column `start`
    uint16_t *lower = blended[0];
    blend_row_by_8(best, in, in_width, start / 8, runs, odd, lower - 4);
    size_t lower_row = 0;
    for (size_t band = 0; 8 * band < out_height + 4; ++band) {
      const uint16_t *const upper = lower;  // the previous band's lower row
      const size_t next_row = band < last_in ? band : last_in;
      if (next_row != lower_row) {  // past the last input row both are the last one
        lower = lower == blended[0] ? blended[1] : blended[0];
        blend_row_by_8(best, in + next_row * in_width, in_width, start / 8, runs, odd, lower - 4);
        lower_row = next_row;
      }
      const size_t first = band == 0 ? 0 : 8 * band - 4;  // first output row of the band
      const size_t end = 8 * band + 4 < out_height ? 8 * band + 4 : out_height;
      uint8_t *band_rows = out + first * out_width + start;
      if (end - first == 8) {
        rows::mix_eight_rows(best, upper, lower, count, band_rows, out_width);
      } else {
        for (size_t y = first; y < end; ++y, band_rows += out_width) {
          const size_t lower_part = 2 * (y + 4 - 8 * band) + 1;  // in sixteenths
          rows::blend_rows_coarse(best, upper, lower,
                                  static_cast<uint32_t>(lower_part << kCoarseShift), count,
                                  band_rows);
        }
      }
    }
  }
}

void blur(const FilterKernels &best, const uint8_t *in, uint16_t height, uint16_t width,
          uint8_t *out) {
  if (height == 0 || width == 0) return;
  if (in == out) {
    blur_in_place(best, out, height, width);
  } else {
    blur_apart(best, in, height, width, out);
  }
}

void scale_up_bilinear(const FilterKernels &best, const uint8_t *in, uint16_t in_height,
                       uint16_t in_width, uint16_t factor, uint8_t *out, uint16_t out_height,
                       uint16_t out_width) {
  const size_t out_pixels = size_t{out_height} * out_width;
  if (out_pixels == 0) return;
  if (in_height == 0 || in_width == 0 || factor == 0) {
    std::memset(out, 0, out_pixels);  // nothing to enlarge: a defined, all-0 result
    return;
  }
  if (factor == 8) {
    scale_up_by_8(best, in, in_height, in_width, out, out_height, out_width);
  } else {
    scale_up_any(best, in, in_height, in_width, factor, out, out_height, out_width);
  }
}

}  // namespace
}  // namespace outside
}  // namespace kel

extern "C" {

void kel_blur_uint8(const uint8_t *in, uint16_t height, uint16_t width, uint8_t *out) {
  kel::outside::blur(kel::outside::filter_kernels(), in, height, width, out);
}

void kel_scale_up_bilinear_uint8(const uint8_t *in, uint16_t in_height, uint16_t in_width,
                                 uint16_t factor, uint8_t *out, uint16_t out_height,
                                 uint16_t out_width) {
  kel::outside::scale_up_bilinear(kel::outside::filter_kernels(), in, in_height, in_width, factor,
                                  out, out_height, out_width);
}

}  // extern "C"
