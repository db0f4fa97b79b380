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

// Output columns whose sample positions are computed at a time (6 bytes each on the stack).
constexpr size_t kScaleStrip = 128;

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
// 255 * 2^16 at most it fits 32 bits. The input rows are blended first: that changes no bit of
// the total, and each blended sample serves every output column between its neighbours.
uint16_t blend_rows(uint8_t top, uint8_t bottom, uint32_t weight_bottom) {
  return static_cast<uint16_t>(top * (256 - weight_bottom) + bottom * weight_bottom);
}

uint8_t blend_columns(uint16_t left, uint16_t right, uint32_t weight_right) {
  const uint32_t total = left * (256 - weight_right) + right * weight_right;
  return static_cast<uint8_t>((total + 32768u) >> 16);
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
  // Column strips: the sample positions of a strip's columns are found once and reused on
  // every row, so the divisions do not run per pixel. With a factor of at least 1, the 128
  // columns of a strip lie between at most 129 consecutive input columns.
  Tap columns[kScaleStrip];
  uint16_t blended[kScaleStrip + 1];
  for (size_t start = 0; start < out_width; start += kScaleStrip) {
    const size_t count = strip_length(start, out_width, kScaleStrip);
    for (size_t i = 0; i < count; ++i) {
      columns[i] = locate(static_cast<uint32_t>(start + i), factor, in_width);
    }
    const size_t first_input = columns[0].first;
    const size_t input_count = size_t{columns[count - 1].second} - first_input + 1;
    for (size_t y = 0; y < out_height; ++y) {
      const Tap row = locate(static_cast<uint32_t>(y), factor, in_height);
      const uint8_t *top = in + size_t{row.first} * in_width + first_input;
      const uint8_t *bottom = in + size_t{row.second} * in_width + first_input;
      for (size_t j = 0; j < input_count; ++j) {
        blended[j] = blend_rows(top[j], bottom[j], row.weight_second);
      }
      uint8_t *out_row = out + y * out_width + start;
      for (size_t i = 0; i < count; ++i) {
        const Tap column = columns[i];
        out_row[i] = blend_columns(blended[column.first - first_input],
                                   blended[column.second - first_input], column.weight_second);
      }
    }
  }
}

}  // extern "C"
