// Our default smoothing and bilinear enlargement, the two image functions the masked fill
// calls outside the library. Both work without heap and with a small, fixed amount of stack.
#include <cstddef>
#include <cstdint>
#include <cstring>

#include "kel_outside.h"

namespace {

// ---------------------------------------------------------------------------------------------
// Blur: [1 2 1] / 4 along the rows, then along the columns, edges clamped.
// ---------------------------------------------------------------------------------------------

// Columns handled at a time; the stack holds one strip (plus two edge bytes) per pass.
constexpr size_t kBlurStrip = 256;

// Each pass rounds half up, so a constant raster stays constant.
uint8_t smooth(unsigned before, unsigned centre, unsigned after) {
  return static_cast<uint8_t>((before + 2 * centre + after + 2) >> 2);
}

size_t strip_length(size_t start, size_t total, size_t strip) {
  return total - start < strip ? total - start : strip;
}

// Horizontal pass from `in` into `out`, which may be the same raster. Each strip of a row is
// copied to the stack before it is overwritten, and its last original byte is carried on as the
// next strip's left neighbour.
void blur_rows(const uint8_t *in, size_t height, size_t width, uint8_t *out) {
  uint8_t window[kBlurStrip + 2];
  for (size_t y = 0; y < height; ++y) {
    const uint8_t *in_row = in + y * width;
    uint8_t *out_row = out + y * width;
    uint8_t left = in_row[0];
    for (size_t start = 0; start < width; start += kBlurStrip) {
      const size_t count = strip_length(start, width, kBlurStrip);
      window[0] = left;
      std::memcpy(window + 1, in_row + start, count);
      // The byte after the strip is not written yet; past the last column the edge repeats.
      window[count + 1] = start + count < width ? in_row[start + count] : window[count];
      left = window[count];
      for (size_t i = 0; i < count; ++i) {
        out_row[start + i] = smooth(window[i], window[i + 1], window[i + 2]);
      }
    }
  }
}

// Vertical pass in place, one strip of columns at a time; `above` carries the original values
// of the row above, which the previous step overwrote.
void blur_columns(uint8_t *pixels, size_t height, size_t width) {
  uint8_t above[kBlurStrip];
  for (size_t start = 0; start < width; start += kBlurStrip) {
    const size_t count = strip_length(start, width, kBlurStrip);
    std::memcpy(above, pixels + start, count);  // the first row is its own upper neighbour
    for (size_t y = 0; y < height; ++y) {
      uint8_t *row = pixels + y * width + start;
      // The last row is its own lower neighbour: row[i] is read below before it is written.
      const uint8_t *below = y + 1 < height ? row + width : row;
      for (size_t i = 0; i < count; ++i) {
        const uint8_t centre = row[i];
        row[i] = smooth(above[i], centre, below[i]);
        above[i] = centre;
      }
    }
  }
}

// ---------------------------------------------------------------------------------------------
// Bilinear enlargement by an integer factor.
// ---------------------------------------------------------------------------------------------

// Output columns handled at a time: 6 bytes of sample position and 4 of blended input rows
// each, on the stack.
constexpr size_t kScaleStrip = 256;

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
  const int64_t scaled = 2 * int64_t{out_index} + 1 - int64_t{factor};
  const int64_t span = 2 * int64_t{factor};
  const uint16_t last = static_cast<uint16_t>(in_size - 1);
  if (scaled <= 0) return Tap{0, 0, 0};
  const int64_t first = scaled / span;  // scaled > 0, so this is the floor
  if (first >= last) return Tap{last, last, 0};
  const int64_t fraction = scaled - first * span;
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

void blend_rows_coarse(const uint16_t *top, const uint16_t *bottom, uint32_t weight_bottom,
                       size_t count, uint8_t *out) {
  const auto bottom_part = static_cast<uint16_t>(weight_bottom >> kCoarseShift);
  const auto top_part = static_cast<uint16_t>(16 - bottom_part);
  for (size_t i = 0; i < count; ++i) {
    const auto total = static_cast<uint16_t>(top[i] * top_part + bottom[i] * bottom_part + 128);
    out[i] = static_cast<uint8_t>(total >> 8);
  }
}

}  // namespace

extern "C" {

void kel_blur_uint8(const uint8_t *in, uint16_t height, uint16_t width, uint8_t *out) {
  if (height == 0 || width == 0) return;
  blur_rows(in, height, width, out);
  blur_columns(out, height, width);
}

void kel_scale_up_bilinear_uint8(const uint8_t *in, uint16_t in_height, uint16_t in_width,
                                 uint16_t factor, uint8_t *out, uint16_t out_height,
                                 uint16_t out_width) {
  const size_t out_pixels = size_t{out_height} * out_width;
  if (out_pixels == 0) return;
  if (in_height == 0 || in_width == 0 || factor == 0) {
    std::memset(out, 0, out_pixels);  // nothing to enlarge: a defined, all-0 result
    return;
  }
  // Column strips: the sample positions of a strip's columns are found once, and each input
  // row is blended along them once for all the output rows between it and its neighbours.
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
    Tap rows_held{0, 0, 0};
    bool held = false;
    for (size_t y = 0; y < out_height; ++y) {
      const Tap row = locate(static_cast<uint32_t>(y), factor, in_height);
      if (!held || row.first != rows_held.first || row.second != rows_held.second) {
        if (held && row.first == rows_held.second) {
          uint16_t *const reused = bottom;  // moving down one input row: the bottom becomes top
          bottom = top;
          top = reused;
        } else {
          blend_row_of_columns(in + size_t{row.first} * in_width, columns, count, shift, top);
        }
        blend_row_of_columns(in + size_t{row.second} * in_width, columns, count, shift, bottom);
        rows_held = row;
        held = true;
      }
      uint8_t *out_row = out + y * out_width + start;
      if (coarse) {
        blend_rows_coarse(top, bottom, row.weight_second, count, out_row);
      } else {
        blend_rows(top, bottom, row.weight_second, count, out_row);
      }
    }
  }
}

}  // extern "C"
