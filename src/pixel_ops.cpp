// Point operations, pasting and blending with a key value, and the masked-region fill.
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <cstring>

#include "kel_images.h"
#include "outside/kel_outside.h"
#include "simd/pixel_ops_simd.h"

namespace {

// Whether any of count bytes equals value; no early exit, so that it vectorises.
bool holds(const uint8_t *bytes, size_t count, uint8_t value) {
  unsigned found = 0;
  for (size_t i = 0; i < count; ++i) found |= bytes[i] == value ? 1u : 0u;
  return found != 0;
}

// ---------------------------------------------------------------------------------------------
// Point operations
// ---------------------------------------------------------------------------------------------

// The pixel count wraps in 32 bits, as the caller's unsigned sizes define it.
uint32_t pixel_count(uint32_t height, uint32_t width) {
  return height * width;
}

// Every percentage of 100 or more moves the whole way.
uint16_t clamp_percent(uint32_t percent) {
  return static_cast<uint16_t>(percent < 100 ? percent : 100);
}

// The change is rounded down. Products stay at most 100 * 255 = 25500, so 16 bits hold them and
// the results equal the 32-bit arithmetic; the narrow lanes let compilers vectorise the loop.
uint8_t brightened(uint8_t value, uint16_t percent) {
  const uint16_t product = static_cast<uint16_t>(percent * (255 - value));
  return static_cast<uint8_t>(value + product / 100);
}

uint8_t darkened(uint8_t value, uint16_t percent) {
  const uint16_t product = static_cast<uint16_t>(percent * value);
  return static_cast<uint8_t>(value - product / 100);
}

// The sum of two bytes (at most 510) halved rounding down always fits a byte.
uint8_t blended(uint8_t target, uint8_t source) {
  return static_cast<uint8_t>((unsigned{target} + unsigned{source}) >> 1);
}

// Whether the destination range starts inside the source range, after its first byte. Only
// then can a row operation write a source byte that it has not read yet; a destination at or
// before the source only ever overwrites source bytes that were already read. So only then must
// a row be done pixel by pixel; otherwise reading ahead gives the same result.
bool starts_inside(const uint8_t *to, const uint8_t *from, size_t count) {
  const uintptr_t to_address = reinterpret_cast<uintptr_t>(to);
  const uintptr_t from_address = reinterpret_cast<uintptr_t>(from);
  return to_address > from_address && to_address - from_address < count;
}

// The vector variant of a row operation where it gives the plain loop's result, else the plain
// loop.
template <class Row>
Row *row_loop(Row *plain_row, Row *vector_row, const uint8_t *to, const uint8_t *from,
              size_t count) {
  return starts_inside(to, from, count) ? plain_row : vector_row;
}

// ---------------------------------------------------------------------------------------------
// Paste and blend
// ---------------------------------------------------------------------------------------------

// The source rows and columns that land inside the destination, as true values in 64 bits: no
// x, y or size can overflow here, even one that breaks the caller's range obligation.
struct VisibleRect {
  int64_t first_row, last_row, first_col, last_col;
  bool empty() const { return first_row > last_row || first_col > last_col; }
};

VisibleRect visible_rect(int32_t dst_height, int32_t dst_width, uint16_t src_height,
                         uint16_t src_width, int32_t x, int32_t y) {
  VisibleRect rect;
  rect.first_row = y <= 0 ? -int64_t{y} : 0;
  rect.last_row =
      int64_t{src_height} + y < dst_height ? int64_t{src_height} - 1 : int64_t{dst_height} - y - 1;
  rect.first_col = x <= 0 ? -int64_t{x} : 0;
  rect.last_col =
      int64_t{src_width} + x < dst_width ? int64_t{src_width} - 1 : int64_t{dst_width} - x - 1;
  return rect;
}

// Copies count bytes with the result of d[i] = s[i] for i = 0, 1, ... in turn, also when the
// ranges overlap. A forward copy that reads ahead (memmove, or the vector loop) equals it unless
// the destination starts inside the source; then the forward copy repeats the first
// (to - from) source bytes, which copying in blocks of that length reproduces, each block's
// source being the previous, finished block.
void copy_forward(const kel::CompositeRowLoops &loops, uint8_t *to, const uint8_t *from,
                  size_t count) {
  if (!starts_inside(to, from, count)) {
    loops.copy(from, count, to);
    return;
  }
  const size_t period = static_cast<size_t>(to - from);
  for (size_t done = 0; done < count; done += period) {
    const size_t block = count - done < period ? count - done : period;
    std::memcpy(to + done, from + done, block);
  }
}

// The keyed row. Looking ahead at the source before writing is safe unless the destination
// starts inside the source; that row takes the pixel loop as a whole. Otherwise the vector
// variant does it, or, without one, pieces that hold no key go as opaque rows.
template <class Rule>
void keyed_row(const kel::CompositeRowLoops &loops, uint8_t *to, const uint8_t *from, size_t count,
               uint8_t transparent) {
  if (starts_inside(to, from, count)) {
    Rule::keyed_loop(kel::plain::composite_row_loops())(from, count, transparent, to);
    return;
  }
#if KEL_USE_HIGHWAY
  Rule::keyed_loop(loops)(from, count, transparent, to);
#else
  // Pixels looked at together: a piece without the key is done as an opaque row.
  constexpr size_t kKeyPiece = 64;
  for (size_t start = 0; start < count; start += kKeyPiece) {
    const size_t piece = count - start < kKeyPiece ? count - start : kKeyPiece;
    if (holds(from + start, piece, transparent)) {
      Rule::keyed_loop(loops)(from + start, piece, transparent, to + start);
    } else {
      Rule::opaque_row(loops, to + start, from + start, piece);
    }
  }
#endif
}

struct Paste {
  static void opaque_row(const kel::CompositeRowLoops &loops, uint8_t *to, const uint8_t *from,
                         size_t count) {
    copy_forward(loops, to, from, count);
  }
  static kel::KeyedRowLoop keyed_loop(const kel::CompositeRowLoops &loops) {
    return loops.paste_with_key;
  }
};

struct Blend {
  static void opaque_row(const kel::CompositeRowLoops &loops, uint8_t *to, const uint8_t *from,
                         size_t count) {
    row_loop(kel::plain::blend_row, loops.blend, to, from, count)(from, count, to);
  }
  static kel::KeyedRowLoop keyed_loop(const kel::CompositeRowLoops &loops) {
    return loops.blend_with_key;
  }
};

// The one walker of paste and blend: clip once, then visit the visible rows top to bottom.
template <class Rule>
void composite(uint8_t *dst, int32_t dst_height, int32_t dst_width, const uint8_t *src,
               uint16_t src_height, uint16_t src_width, int32_t x, int32_t y, uint16_t key) {
  const VisibleRect rect = visible_rect(dst_height, dst_width, src_height, src_width, x, y);
  if (rect.empty()) return;
  const kel::CompositeRowLoops loops = kel::simd::composite_row_loops();
  const size_t count = static_cast<size_t>(rect.last_col - rect.first_col + 1);
  for (int64_t row = rect.first_row; row <= rect.last_row; ++row) {
    // Both offsets lie inside their rasters, which the caller sized, so they fit ptrdiff_t.
    const uint8_t *from = src + static_cast<ptrdiff_t>(row * src_width + rect.first_col);
    uint8_t *to = dst + static_cast<ptrdiff_t>((y + row) * dst_width + x + rect.first_col);
    if (key > 255) {
      Rule::opaque_row(loops, to, from, count);
    } else {
      keyed_row<Rule>(loops, to, from, count, static_cast<uint8_t>(key));
    }
  }
}

// ---------------------------------------------------------------------------------------------
// Masked-region fill
// ---------------------------------------------------------------------------------------------

// Above this the enlarged sides (cells * 8) would not fit their 16 bits.
constexpr uint32_t kMaxFillSide = 65528;
constexpr uint16_t kBlockSide = 8;

uint16_t cells_for(uint16_t pixels) {
  return static_cast<uint16_t>((pixels >> 3) + ((pixels & 7) != 0 ? 1 : 0));
}

bool is_hole(uint8_t mask_value) {
  return mask_value == 0;
}
bool is_known(uint8_t mask_value) {
  return mask_value != 0;
}

uint8_t max3(uint8_t a, uint8_t b, uint8_t c) {
  const uint8_t ab = a > b ? a : b;
  return ab > c ? ab : c;
}

uint8_t min3(uint8_t a, uint8_t b, uint8_t c) {
  const uint8_t ab = a < b ? a : b;
  return ab < c ? ab : c;
}

// Interior columns classified together; a piece's windows take about 1 KiB of stack.
constexpr size_t kEdgePiece = 256;

// The smallest and largest mask value in the 3 x 3 window of each pixel of one piece of an
// interior row. A border pixel (known, a hole among its neighbours) has a window minimum of 0,
// a seam pixel (a hole, a known neighbour) a nonzero window maximum: which neighbour is found
// first does not change whether one exists. The windows are taken in two separable halves,
// columns of three and then rows of three, in loops without branches that vectorise.
struct WindowPiece {
  size_t first = 0;  // the piece's first column
  size_t count = 0;
  uint8_t minimum[kEdgePiece];
  uint8_t maximum[kEdgePiece];
};

// Fills `piece` for columns first .. first + count - 1 of row y; returns false, leaving the
// windows unset, when none of them holds a hole, since such a piece has no border or seam pixel.
bool look_at_windows(const uint8_t *mask, size_t width, size_t y, size_t first, size_t count,
                     WindowPiece &piece) {
  uint8_t column_extreme[kEdgePiece + 2];
  const uint8_t *above = mask + (y - 1) * width + (first - 1);
  const uint8_t *row = above + width;
  const uint8_t *below = row + width;
  const size_t span = count + 2;
  for (size_t i = 0; i < span; ++i) column_extreme[i] = min3(above[i], row[i], below[i]);
  if (!holds(column_extreme, span, 0)) return false;
  for (size_t i = 0; i < count; ++i) {
    piece.minimum[i] = min3(column_extreme[i], column_extreme[i + 1], column_extreme[i + 2]);
  }
  for (size_t i = 0; i < span; ++i) column_extreme[i] = max3(above[i], row[i], below[i]);
  for (size_t i = 0; i < count; ++i) {
    piece.maximum[i] = max3(column_extreme[i], column_extreme[i + 1], column_extreme[i + 2]);
  }
  piece.first = first;
  piece.count = count;
  return true;
}

// Calls visit(y, piece) for the pieces of interior rows whose windows hold a hole, rows top to
// bottom. Pieces end at multiples of kEdgePiece, so no 8-pixel cell straddles two of them.
template <class Visit>
void for_each_window_piece(const uint8_t *mask, uint16_t height, uint16_t width, Visit visit) {
  if (height <= 2 || width <= 2) return;
  const size_t end = size_t{width} - 1;  // one past the last interior column
  WindowPiece piece;
  for (size_t y = 1; y + 1 < height; ++y) {
    for (size_t first = 1; first < end;) {
      const size_t piece_end = (first / kEdgePiece + 1) * kEdgePiece;
      const size_t last_end = piece_end < end ? piece_end : end;
      if (look_at_windows(mask, width, y, first, last_end - first, piece)) visit(y, piece);
      first = last_end;
    }
  }
}

// Each cell takes the largest source value among its border pixels (known pixels next to the
// hole); a value of 0 leaves it empty. A piece's border values are set out first, 0 elsewhere,
// and then each cell takes the largest of its eight.
void gather_edge_values(const uint8_t *src, const uint8_t *mask, uint16_t height, uint16_t width,
                        uint8_t *grid, uint16_t grid_width) {
  uint8_t border_values[kEdgePiece];
  for_each_window_piece(mask, height, width, [&](size_t y, const WindowPiece &piece) {
    const size_t offset = y * width + piece.first;
    const uint8_t *mask_row = mask + offset;
    const uint8_t *src_row = src + offset;
    const uint8_t *window_minimum = piece.minimum;
    const size_t count = piece.count;
    for (size_t i = 0; i < count; ++i) {
      const bool border = is_known(mask_row[i]) && window_minimum[i] == 0;
      border_values[i] = border ? src_row[i] : 0;
    }
    uint8_t *cells = grid + (y >> 3) * grid_width;
    for (size_t i = 0; i < piece.count;) {
      const size_t x = piece.first + i;
      const size_t cell_end = (x | 7) + 1;
      const size_t n = cell_end - x < piece.count - i ? cell_end - x : piece.count - i;
      uint8_t largest = 0;
      for (size_t k = 0; k < n; ++k)
        largest = border_values[i + k] > largest ? border_values[i + k] : largest;
      uint8_t &cell = cells[x >> 3];
      if (cell < largest) cell = largest;
      i += n;
    }
  });
}

// The seam (interior hole pixels next to kept ones) takes the blurred result. The blurred raster
// is a separate buffer, so the order of these writes does not matter, and the other pixels are
// stored back unchanged, which lets the loop run as vector selects.
void soften_seam(const uint8_t *mask, uint16_t height, uint16_t width, const uint8_t *blurred,
                 uint8_t *dst) {
  for_each_window_piece(mask, height, width, [&](size_t y, const WindowPiece &piece) {
    const size_t offset = y * width + piece.first;
    const uint8_t *mask_row = mask + offset;
    const uint8_t *blurred_row = blurred + offset;
    uint8_t *dst_row = dst + offset;
    const uint8_t *window_maximum = piece.maximum;
    const size_t count = piece.count;
    for (size_t i = 0; i < count; ++i) {
      const bool seam = is_hole(mask_row[i]) && window_maximum[i] != 0;
      const uint8_t kept = dst_row[i];
      dst_row[i] = seam ? blurred_row[i] : kept;
    }
  });
}

// Grid columns handled at a time by the vertical half of a dilation pass.
constexpr size_t kDilateStrip = 256;

// One dilation pass: every empty cell of `current` with a filled neighbour receives, in `next`,
// the largest neighbour value. It reads only `current`, so cells filled now feed nothing before
// the next pass. Returns the number of cells filled.
//
// The largest value of an empty cell's clamped 3 x 3 window is its largest neighbour value (the
// cell itself is 0). The window maximum is taken in two separable halves: rows of three into
// `next`, then columns of three in place, one strip at a time, with the rows above carried on
// the stack. Filled cells are then stored back from `current`, which `next` equals at the start
// of every pass, so `next` ends exactly as if only the newly filled cells had been written; the
// loops have no branches and vectorise.
uint32_t dilate_once(const uint8_t *current, uint8_t *next, size_t grid_height, size_t grid_width) {
  if (grid_height == 0 || grid_width == 0) return 0;
  for (size_t cy = 0; cy < grid_height; ++cy) {
    const uint8_t *row = current + cy * grid_width;
    uint8_t *out = next + cy * grid_width;
    if (grid_width == 1) {
      out[0] = row[0];
      continue;
    }
    out[0] = max3(row[0], row[0], row[1]);
    for (size_t cx = 1; cx + 1 < grid_width; ++cx)
      out[cx] = max3(row[cx - 1], row[cx], row[cx + 1]);
    out[grid_width - 1] = max3(row[grid_width - 2], row[grid_width - 1], row[grid_width - 1]);
  }

  uint32_t filled = 0;
  uint8_t above[kDilateStrip];
  for (size_t start = 0; start < grid_width; start += kDilateStrip) {
    const size_t count = grid_width - start < kDilateStrip ? grid_width - start : kDilateStrip;
    std::memcpy(above, next + start, count);  // the first row is its own upper neighbour
    for (size_t cy = 0; cy < grid_height; ++cy) {
      uint8_t *row_maxima = next + cy * grid_width + start;
      // The last row is its own lower neighbour: row_maxima[i] is read below before it is
      // written.
      const uint8_t *below = cy + 1 < grid_height ? row_maxima + grid_width : row_maxima;
      const uint8_t *cells = current + cy * grid_width + start;
      for (size_t i = 0; i < count; ++i) {
        const uint8_t centre = row_maxima[i];
        const uint8_t window = max3(above[i], centre, below[i]);
        above[i] = centre;
        const bool empty = cells[i] == 0;
        filled += empty && window != 0 ? 1u : 0u;
        row_maxima[i] = empty ? window : cells[i];
      }
    }
  }
  return filled;
}

// Spreads the gathered values until a pass fills nothing; `next` starts as a copy of `current`.
void dilate_until_full(uint8_t *current, uint8_t *next, uint16_t grid_height, uint16_t grid_width) {
  const size_t cells = size_t{grid_height} * grid_width;
  std::memcpy(next, current, cells);
  uint32_t filled = 0;
  do {
    filled = dilate_once(current, next, grid_height, grid_width);
    std::memcpy(current, next, cells);
  } while (filled != 0);
}

// a * b bytes, or null when the product does not fit size_t or malloc fails. A zero-byte
// buffer is asked for as one byte, so that a null can only mean failure.
uint8_t *allocate_bytes(size_t a, size_t b) {
  if (b != 0 && a > SIZE_MAX / b) return nullptr;
  const size_t bytes = a * b;
  return static_cast<uint8_t *>(std::malloc(bytes != 0 ? bytes : 1));
}

// The four scratch buffers of one fill, taken in this order and released together.
struct FillScratch {
  uint8_t *enlarged = nullptr;
  uint8_t *current = nullptr;
  uint8_t *next = nullptr;
  uint8_t *blurred = nullptr;

  bool allocate(uint16_t height, uint16_t width, uint16_t grid_height, uint16_t grid_width,
                uint16_t big_height, uint16_t big_width) {
    enlarged = allocate_bytes(big_height, big_width);
    if (enlarged != nullptr) current = allocate_bytes(grid_height, grid_width);
    if (current != nullptr) next = allocate_bytes(grid_height, grid_width);
    if (next != nullptr) blurred = allocate_bytes(height, width);
    return blurred != nullptr;
  }
  ~FillScratch() {
    std::free(enlarged);
    std::free(current);
    std::free(next);
    std::free(blurred);
  }
};

void fill_masked(const uint8_t *src, uint16_t height, uint16_t width, const uint8_t *mask,
                 uint8_t *dst) {
  const uint16_t grid_height = cells_for(height);
  const uint16_t grid_width = cells_for(width);
  const uint16_t big_height = static_cast<uint16_t>(grid_height * kBlockSide);
  const uint16_t big_width = static_cast<uint16_t>(grid_width * kBlockSide);
  const size_t pixels = size_t{height} * width;

  FillScratch scratch;
  if (!scratch.allocate(height, width, grid_height, grid_width, big_height, big_width)) return;

  if (dst != src && pixels != 0) std::memcpy(dst, src, pixels);
  std::memset(scratch.current, 0, size_t{grid_height} * grid_width);
  gather_edge_values(src, mask, height, width, scratch.current, grid_width);
  dilate_until_full(scratch.current, scratch.next, grid_height, grid_width);

  kel_blur_uint8(scratch.current, grid_height, grid_width, scratch.current);
  kel_scale_up_bilinear_uint8(scratch.current, grid_height, grid_width, kBlockSide,
                              scratch.enlarged, big_height, big_width);

  // Every hole pixel, edge rows and columns included, takes the enlarged surface. Known pixels
  // are stored back unchanged, which lets the loop run as vector selects.
  for (size_t y = 0; y < height; ++y) {
    const uint8_t *mask_row = mask + y * width;
    const uint8_t *enlarged_row = scratch.enlarged + y * big_width;
    uint8_t *dst_row = dst + y * width;
    for (size_t x = 0; x < width; ++x) {
      const uint8_t kept = dst_row[x];
      dst_row[x] = is_hole(mask_row[x]) ? enlarged_row[x] : kept;
    }
  }

  kel_blur_uint8(dst, height, width, scratch.blurred);
  soften_seam(mask, height, width, scratch.blurred, dst);
}

}  // namespace

namespace kel {
namespace plain {

// Each output byte is written after the input byte at the same index was read, so the rows
// work in place.
void brighten_row(const uint8_t *in, size_t count, uint16_t percent, uint8_t *out) {
  for (size_t i = 0; i < count; ++i) out[i] = brightened(in[i], percent);
}

void darken_row(const uint8_t *in, size_t count, uint16_t percent, uint8_t *out) {
  for (size_t i = 0; i < count; ++i) out[i] = darkened(in[i], percent);
}

// Each source pixel is read just before its destination pixel is written.
// memmove reads ahead, which the callers allow.
void copy_row(const uint8_t *in, size_t count, uint8_t *out) {
  if (count != 0) std::memmove(out, in, count);
}

void blend_row(const uint8_t *in, size_t count, uint8_t *out) {
  for (size_t i = 0; i < count; ++i) out[i] = blended(out[i], in[i]);
}

void paste_row_with_key(const uint8_t *in, size_t count, uint8_t key, uint8_t *out) {
  for (size_t i = 0; i < count; ++i) {
    const uint8_t value = in[i];
    if (value != key) out[i] = value;
  }
}

void blend_row_with_key(const uint8_t *in, size_t count, uint8_t key, uint8_t *out) {
  for (size_t i = 0; i < count; ++i) {
    const uint8_t value = in[i];
    if (value != key) out[i] = blended(out[i], value);
  }
}

}  // namespace plain
}  // namespace kel

extern "C" {

void kel_image_brighten(const uint8_t *src, uint32_t height, uint32_t width, uint32_t percent,
                        uint8_t *dst) {
  const uint32_t count = pixel_count(height, width);
  row_loop(kel::plain::brighten_row, kel::simd::brighten_row, dst, src, count)(
      src, count, clamp_percent(percent), dst);
}

void kel_image_darken(const uint8_t *src, uint32_t height, uint32_t width, uint32_t percent,
                      uint8_t *dst) {
  const uint32_t count = pixel_count(height, width);
  row_loop(kel::plain::darken_row, kel::simd::darken_row, dst, src, count)(
      src, count, clamp_percent(percent), dst);
}

void kel_get_mask(const uint8_t *src, uint32_t height, uint32_t width, int32_t key, uint8_t *mask) {
  const uint32_t count = pixel_count(height, width);
  if (count == 0) return;
  // A key no byte can hold equals no pixel: the mask is all 1 whatever the image holds.
  if (key < 0 || key > 255) {
    std::memset(mask, 1, count);
    return;
  }
  const uint8_t hole_value = static_cast<uint8_t>(key);
  for (uint32_t i = 0; i < count; ++i) mask[i] = src[i] == hole_value ? 0 : 1;
}

void kel_image_draw_image(uint8_t *dst, int32_t dst_height, int32_t dst_width, const uint8_t *src,
                          uint16_t src_height, uint16_t src_width, int32_t x, int32_t y,
                          uint16_t key) {
  composite<Paste>(dst, dst_height, dst_width, src, src_height, src_width, x, y, key);
}

void kel_image_blend_image(uint8_t *dst, int32_t dst_height, int32_t dst_width, const uint8_t *src,
                           uint16_t src_height, uint16_t src_width, int32_t x, int32_t y,
                           uint16_t key) {
  composite<Blend>(dst, dst_height, dst_width, src, src_height, src_width, x, y, key);
}

void kel_mask_image(const uint8_t *src, uint16_t height, uint16_t width, const uint8_t *mask,
                    uint8_t *dst) {
  if (height > kMaxFillSide || width > kMaxFillSide) return;
  fill_masked(src, height, width, mask, dst);
}

}  // extern "C"
