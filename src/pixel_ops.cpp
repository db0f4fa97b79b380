// Point operations, pasting and blending with a key value, and the masked-region fill.
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <cstring>

#include "kel_images.h"
#include "kernels.h"
#include "outside/kel_outside.h"

namespace {

// Whether any of count bytes equals value; no early exit and a byte-wide flag, so that it
// vectorises without widening.
bool holds(const uint8_t *bytes, size_t count, uint8_t value) {
  uint8_t found = 0;
  for (size_t i = 0; i < count; ++i) found |= static_cast<uint8_t>(bytes[i] == value);
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

// Copies count bytes with the result of d[i] = s[i] for i = 0, 1, ... in turn, for a destination
// that starts inside the source: a forward copy that reads ahead (memmove, or a vector loop)
// would differ, but repeating the first (to - from) source bytes, which copying in blocks of that
// length does, each block's source being the previous, finished block, gives the same bytes.
void copy_in_order(const uint8_t *from, size_t count, uint8_t *to) {
  const size_t period = static_cast<size_t>(to - from);
  for (size_t done = 0; done < count; done += period) {
    const size_t block = count - done < period ? count - done : period;
    std::memcpy(to + done, from + done, block);
  }
}

// How a paste or a blend writes a row, without a key and with one. A paste only writes its
// destination rows, so it asks for the next one ahead: destination rows lie a raster row apart,
// too far for the hardware's prefetching to follow. A blend reads its destination too, and the
// hardware's prefetching of that read is enough; so does a keyed paste on the tables whose rows
// choose their bytes in a register.
struct Compositing {
  kel::Row kel::Kernels::*opaque;
  kel::RowWith<uint8_t> kel::Kernels::*keyed;
  bool writes_only;
};

constexpr Compositing kPaste{&kel::Kernels::copy, &kel::Kernels::paste_keyed, true};
constexpr Compositing kBlend{&kel::Kernels::blend, &kel::Kernels::blend_keyed, false};

// The one walker of paste and blend: clip once, take the table once, then visit the visible rows
// top to bottom. A row whose destination starts inside its source goes by the plain body alone.
void composite(const Compositing &rule, uint8_t *dst, int32_t dst_height, int32_t dst_width,
               const uint8_t *src, uint16_t src_height, uint16_t src_width, int32_t x, int32_t y,
               uint16_t key) {
  const VisibleRect rect = visible_rect(dst_height, dst_width, src_height, src_width, x, y);
  if (rect.empty()) return;
  const kel::Kernels &best = kel::kernels();
  const size_t count = static_cast<size_t>(rect.last_col - rect.first_col + 1);
  const bool ahead = rule.writes_only && (key > 255 || !best.paste_keyed_reads_out);
  for (int64_t row = rect.first_row; row <= rect.last_row; ++row) {
    // Both offsets lie inside their rasters, which the caller sized, so they fit ptrdiff_t.
    const uint8_t *from = src + static_cast<ptrdiff_t>(row * src_width + rect.first_col);
    uint8_t *to = dst + static_cast<ptrdiff_t>((y + row) * dst_width + x + rect.first_col);
    if (ahead) {
      best.prefetch_for_writing(reinterpret_cast<uintptr_t>(to) + static_cast<uintptr_t>(dst_width),
                                count);
    }
    if (key > 255) {
      kel::run_row(rule.opaque, best, from, count, to);
    } else {
      kel::run_row(rule.keyed, best, from, count, static_cast<uint8_t>(key), to);
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

// The columns from a row's first hole pixel to its last, half open; empty when it has none.
struct ColumnRange {
  size_t first = 0;
  size_t end = 0;
  bool empty() const { return first >= end; }
};

ColumnRange merged(ColumnRange a, ColumnRange b) {
  if (a.empty()) return b;
  if (b.empty()) return a;
  return {a.first < b.first ? a.first : b.first, a.end > b.end ? a.end : b.end};
}

// Most mask rows hold no hole, and those that do hold it in a short stretch: memchr finds the
// first hole at memory speed, and the last is sought backwards from the row's end.
ColumnRange hole_columns(const kel::Kernels &row_kernels, const uint8_t *mask_row, size_t width) {
  const void *first_hole = width != 0 ? std::memchr(mask_row, 0, width) : nullptr;
  if (first_hole == nullptr) return {};
  const size_t first = static_cast<size_t>(static_cast<const uint8_t *>(first_hole) - mask_row);
  const uint8_t *rest = mask_row + first;
  size_t end = width - first;
  end -= row_kernels.nonzero_tail(rest, end);
  end -= kel::kPlainKernels.nonzero_tail(rest, end);
  return {first, first + end};
}

// Interior columns classified together; a piece's windows and values take about 3 bytes of stack
// per column, so builds for size (MinSizeRel, as for microcontrollers) take shorter pieces.
#if KEL_SMALL_BUILD
constexpr size_t kEdgePiece = 128;
#else
constexpr size_t kEdgePiece = 256;
#endif

// Which extreme of each pixel's 3 x 3 window of mask values is taken. A border pixel (known, a
// hole among its neighbours) has a window minimum of 0, a seam pixel (a hole, a known
// neighbour) a nonzero window maximum: which neighbour is found first does not change whether
// one exists.
enum class Extreme { kSmallest, kLargest };

// The chosen extreme of the window of each pixel of one piece of an interior row, taken in two
// separable halves, columns of three and then rows of three, in loops without branches that
// vectorise.
struct WindowPiece {
  size_t first = 0;  // the piece's first column
  size_t count = 0;
  uint8_t extreme[kEdgePiece];
};

// out[i] = the chosen extreme of a[i], b[i] and c[i]. Each loop is left without branches, so that
// it vectorises.
void extremes_of_three(Extreme which, const uint8_t *a, const uint8_t *b, const uint8_t *c,
                       size_t count, uint8_t *out) {
  if (which == Extreme::kSmallest) {
    for (size_t i = 0; i < count; ++i) out[i] = min3(a[i], b[i], c[i]);
  } else {
    for (size_t i = 0; i < count; ++i) out[i] = max3(a[i], b[i], c[i]);
  }
}

// Fills `piece` for columns first .. first + count - 1 of row y; returns false, leaving the
// windows unset, when the piece can hold no border pixel (no window holds a hole) or no seam
// pixel (no pixel is a hole).
bool look_at_windows(Extreme which, const uint8_t *mask, size_t width, size_t y, size_t first,
                     size_t count, WindowPiece &piece) {
  uint8_t column_extreme[kEdgePiece + 2];
  const uint8_t *above = mask + (y - 1) * width + (first - 1);
  const uint8_t *row = above + width;
  const uint8_t *below = row + width;
  const size_t span = count + 2;
  if (which == Extreme::kLargest && !holds(row + 1, count, 0)) return false;
  extremes_of_three(which, above, row, below, span, column_extreme);
  if (which == Extreme::kSmallest && !holds(column_extreme, span, 0)) return false;
  extremes_of_three(which, column_extreme, column_extreme + 1, column_extreme + 2, count,
                    piece.extreme);
  piece.first = first;
  piece.count = count;
  return true;
}

// The rasters of one fill, as the steps that visit window pieces read and write them.
struct FillRasters {
  const kel::Kernels &row_kernels;
  const uint8_t *src, *mask;
  uint16_t height, width;
  uint8_t *grid;
  uint16_t grid_width;
  const uint8_t *blurred;
  uint8_t *dst;
};

using PieceVisit = void (*)(const FillRasters &fill, size_t y, const WindowPiece &piece);

// Calls visit(fill, y, piece) for the pieces of interior rows whose windows hold a hole, rows top
// to bottom. Only the columns whose windows reach between the first and last hole of the three
// rows are looked at. Pieces end at multiples of kEdgePiece, so no 8-pixel cell straddles two
// of them.
void for_each_window_piece(Extreme which, const FillRasters &fill, PieceVisit visit) {
  const uint8_t *const mask = fill.mask;
  const size_t height = fill.height, width = fill.width;
  if (height <= 2 || width <= 2) return;
  ColumnRange above = hole_columns(fill.row_kernels, mask, width);
  ColumnRange row = hole_columns(fill.row_kernels, mask + width, width);
  WindowPiece piece;
  for (size_t y = 1; y + 1 < height; ++y) {
    const ColumnRange below = hole_columns(fill.row_kernels, mask + (y + 1) * width, width);
    const ColumnRange holes = merged(merged(above, row), below);
    above = row;
    row = below;
    if (holes.empty()) continue;
    // Interior columns x with a hole among x - 1 .. x + 1.
    const size_t start = holes.first > 1 ? holes.first - 1 : 1;
    const size_t end = holes.end + 1 < width - 1 ? holes.end + 1 : width - 1;
    for (size_t first = start; first < end;) {
      const size_t piece_end = (first / kEdgePiece + 1) * kEdgePiece;
      const size_t last_end = piece_end < end ? piece_end : end;
      if (look_at_windows(which, mask, width, y, first, last_end - first, piece)) {
        visit(fill, y, piece);
      }
      first = last_end;
    }
  }
}

// 0xFF for true, 0 for false.
uint8_t all_or_none(bool condition) {
  return static_cast<uint8_t>(condition ? 0xFF : 0);
}

// `from` where take holds, else `keep`. Written as a bitwise blend, not a branch, so that loops
// of it vectorise.
uint8_t chosen(bool take, uint8_t from, uint8_t keep) {
  const uint8_t taken = all_or_none(take);
  return static_cast<uint8_t>((from & taken) | (keep & ~taken));
}

// Each cell takes the largest source value among its border pixels (known pixels next to the
// hole); a value of 0 leaves it empty. A piece's border values are set out first, 0 elsewhere,
// from the start of the piece's first cell, and then each cell with a nonzero value among its
// eight takes the largest; border pixels are few, so most cells are passed over a word at a
// time.
void gather_edge_values(const FillRasters &fill, size_t y, const WindowPiece &piece) {
  // Pieces lie inside one kEdgePiece-aligned block of columns, so a piece with the lead to its
  // first cell's start fits.
  uint8_t border_values[kEdgePiece];
  const size_t offset = y * fill.width + piece.first;
  const uint8_t *mask_row = fill.mask + offset;
  const uint8_t *src_row = fill.src + offset;
  const size_t lead = piece.first & (kBlockSide - 1);
  const size_t used = lead + piece.count;
  const size_t padded = (used + kBlockSide - 1) & ~size_t{kBlockSide - 1};
  std::memset(border_values, 0, lead);
  std::memset(border_values + used, 0, padded - used);
  uint8_t *values = border_values + lead;
  for (size_t i = 0; i < piece.count; ++i) {
    const bool border = is_known(mask_row[i]) & (piece.extreme[i] == 0);
    values[i] = static_cast<uint8_t>(src_row[i] & all_or_none(border));
  }
  uint8_t *cells = fill.grid + (y >> 3) * fill.grid_width + (piece.first >> 3);
  for (size_t i = 0; i < padded; i += kBlockSide) {
    uint64_t eight;
    std::memcpy(&eight, border_values + i, sizeof eight);
    if (eight == 0) continue;
    uint8_t largest = 0;
    for (size_t k = 0; k < kBlockSide; ++k) {
      largest = border_values[i + k] > largest ? border_values[i + k] : largest;
    }
    uint8_t &cell = cells[i / kBlockSide];
    if (cell < largest) cell = largest;
  }
}

// Every hole pixel, edge rows and columns included, takes the enlarged surface. Only the
// stretch of each row between its first and last hole is looked at.
void fill_holes(const kel::Kernels &row_kernels, const uint8_t *mask, uint16_t height,
                uint16_t width, const uint8_t *enlarged, uint16_t enlarged_width, uint8_t *dst) {
  for (size_t y = 0; y < height; ++y) {
    const uint8_t *mask_row = mask + y * width;
    const uint8_t *from = enlarged + y * enlarged_width;
    uint8_t *row = dst + y * width;
    const ColumnRange holes = hole_columns(row_kernels, mask_row, width);
    for (size_t x = holes.first; x < holes.end; ++x) {
      row[x] = chosen(is_hole(mask_row[x]), from[x], row[x]);
    }
  }
}

// The seam (interior hole pixels next to kept ones) takes the blurred result. The blurred raster
// is a separate buffer, so the order of these writes does not matter.
void soften_seam(const FillRasters &fill, size_t y, const WindowPiece &piece) {
  const size_t offset = y * fill.width + piece.first;
  const uint8_t *mask_row = fill.mask + offset;
  const uint8_t *from = fill.blurred + offset;
  uint8_t *row = fill.dst + offset;
  for (size_t i = 0; i < piece.count; ++i) {
    row[i] = chosen(is_hole(mask_row[i]) & (piece.extreme[i] != 0), from[i], row[i]);
  }
}

// The dilation passes, computed in two sweeps. A pass fills the empty cells next to cells
// filled before it, each with the largest of those neighbours' values, and a filled cell never
// changes; so a cell is filled by the pass numbered by its chessboard distance
// (max(|dx|, |dy|)) to the nearest gathered cell, and takes the largest value among the
// gathered cells at that distance: stepping from it toward any of them one cell at a time
// reaches a cell filled one pass earlier that holds that one among its own. Every cell thus
// ends with the smallest key 256 * distance + (255 - value) over the gathered cells, as 255 -
// value is below 256. Distance is a shortest path of king's moves, and each such path can be
// laid out as moves down and rightward followed by moves up and leftward; so a sweep from the
// top that takes each row's upper neighbours and then its left neighbour, and one from the
// bottom that takes the lower neighbours and then the right one, find every key. An empty grid
// stays empty, as the passes leave it.
constexpr uint32_t kKeyStep = 256;                  // one cell of distance
constexpr uint32_t kUnreached = uint32_t{1} << 31;  // no path can grow it past 2^32

uint32_t min_key(uint32_t a, uint32_t b) {
  return a < b ? a : b;
}

// Each key of `row` takes its three neighbours in the finished row `from`, one step on.
void take_from_row(const uint32_t *from, uint32_t *row, size_t grid_width) {
  if (grid_width == 1) {
    row[0] = min_key(row[0], from[0] + kKeyStep);
    return;
  }
  row[0] = min_key(row[0], min_key(from[0], from[1]) + kKeyStep);
  for (size_t x = 1; x + 1 < grid_width; ++x) {
    row[x] = min_key(row[x], min_key(min_key(from[x - 1], from[x]), from[x + 1]) + kKeyStep);
  }
  const size_t last = grid_width - 1;
  row[last] = min_key(row[last], min_key(from[last - 1], from[last]) + kKeyStep);
}

// Fills every cell reachable from a gathered one; `keys` is scratch for one key per cell.
void dilate_until_full(uint8_t *grid, uint16_t grid_height, uint16_t grid_width, uint32_t *keys) {
  const size_t cells = size_t{grid_height} * grid_width;
  if (cells == 0) return;  // rows of no cells, or no rows
  for (size_t i = 0; i < cells; ++i) keys[i] = grid[i] != 0 ? 255u - grid[i] : kUnreached;
  for (size_t cy = 0; cy < grid_height; ++cy) {
    uint32_t *row = keys + cy * grid_width;
    if (cy > 0) take_from_row(row - grid_width, row, grid_width);
    for (size_t x = 1; x < grid_width; ++x) row[x] = min_key(row[x], row[x - 1] + kKeyStep);
  }
  for (size_t cy = grid_height; cy-- > 0;) {
    uint32_t *row = keys + cy * grid_width;
    if (cy + 1 < grid_height) take_from_row(row + grid_width, row, grid_width);
    for (size_t x = grid_width; x-- > 1;) row[x - 1] = min_key(row[x - 1], row[x] + kKeyStep);
  }
  for (size_t i = 0; i < cells; ++i) {
    grid[i] = keys[i] >= kUnreached ? 0 : static_cast<uint8_t>(255 - (keys[i] & 255));
  }
}

// The sides of one fill: the source, its grid of 8 x 8 cells and the enlarged grid.
struct FillSizes {
  uint16_t height, width, grid_height, grid_width, big_height, big_width;
  size_t pixels() const { return size_t{height} * width; }
  size_t cells() const { return size_t{grid_height} * grid_width; }
  size_t big_pixels() const { return size_t{big_height} * big_width; }
};

FillSizes fill_sizes(uint16_t height, uint16_t width) {
  const uint16_t grid_height = cells_for(height);
  const uint16_t grid_width = cells_for(width);
  return {height,
          width,
          grid_height,
          grid_width,
          static_cast<uint16_t>(grid_height * kBlockSide),
          static_cast<uint16_t>(grid_width * kBlockSide)};
}

// The four scratch buffers of one fill. The sweeps need no second grid, so `next` stays unused;
// it is kept so that hosts that count or fail allocations see the four they always saw. The
// enlarged raster, 64 bytes per cell, holds the sweeps' 32-bit keys until the enlargement writes
// it, so it comes first and aligned as for uint32_t.
struct FillScratch {
  uint8_t *enlarged, *current, *next, *blurred;
};

// Sum of the four buffers' sizes, or 0 when it does not fit size_t (the sides are at most 65528,
// so that happens only where size_t has 32 bits). Slack for aligning the block is included.
size_t scratch_bytes_for(const FillSizes &s) {
  const size_t parts[] = {s.big_pixels(), s.cells(), s.cells(), s.pixels(), alignof(uint32_t) - 1};
  size_t total = 0;
  for (const size_t part : parts) {
    if (part > SIZE_MAX - total) return 0;
    total += part;
  }
  return total;
}

// The four buffers carved out of one block, the first aligned for the keys.
FillScratch carve(const FillSizes &s, void *block) {
  const uintptr_t at = reinterpret_cast<uintptr_t>(block);
  const uintptr_t misalignment = at % alignof(uint32_t);
  uint8_t *start =
      static_cast<uint8_t *>(block) + (misalignment != 0 ? alignof(uint32_t) - misalignment : 0);
  FillScratch scratch;
  scratch.enlarged = start;
  scratch.current = scratch.enlarged + s.big_pixels();
  scratch.next = scratch.current + s.cells();
  scratch.blurred = scratch.next + s.cells();
  return scratch;
}

void fill_masked(const uint8_t *src, const FillSizes &s, const uint8_t *mask, uint8_t *dst,
                 const FillScratch &scratch) {
  const uint16_t height = s.height, width = s.width;
  if (dst != src && s.pixels() != 0) std::memcpy(dst, src, s.pixels());
  std::memset(scratch.current, 0, s.cells());
  const kel::Kernels &row_kernels = kel::kernels();
  const FillRasters fill{row_kernels,     src, mask, height, width, scratch.current, s.grid_width,
                         scratch.blurred, dst};
  for_each_window_piece(Extreme::kSmallest, fill, gather_edge_values);
  dilate_until_full(scratch.current, s.grid_height, s.grid_width,
                    reinterpret_cast<uint32_t *>(scratch.enlarged));

  kel_blur_uint8(scratch.current, s.grid_height, s.grid_width, scratch.current);
  kel_scale_up_bilinear_uint8(scratch.current, s.grid_height, s.grid_width, kBlockSide,
                              scratch.enlarged, s.big_height, s.big_width);

  fill_holes(row_kernels, mask, height, width, scratch.enlarged, s.big_width, dst);
  kel_blur_uint8(dst, height, width, scratch.blurred);
  for_each_window_piece(Extreme::kLargest, fill, soften_seam);
}

// n bytes from malloc; a zero-byte buffer is asked for as one byte, so that a null can only mean
// failure.
uint8_t *allocate_bytes(size_t n) {
  return static_cast<uint8_t *>(std::malloc(n != 0 ? n : 1));
}

// The heap-using fill: the four buffers taken in order, each only if the one before was had, and
// released together. Each size is a product of two 16-bit sides, so it fits size_t.
void fill_from_heap(const uint8_t *src, const FillSizes &s, const uint8_t *mask, uint8_t *dst) {
  FillScratch scratch{allocate_bytes(s.big_pixels()), nullptr, nullptr, nullptr};
  if (scratch.enlarged != nullptr) scratch.current = allocate_bytes(s.cells());
  if (scratch.current != nullptr) scratch.next = allocate_bytes(s.cells());
  if (scratch.next != nullptr) scratch.blurred = allocate_bytes(s.pixels());
  if (scratch.blurred != nullptr) fill_masked(src, s, mask, dst, scratch);
  std::free(scratch.enlarged);
  std::free(scratch.current);
  std::free(scratch.next);
  std::free(scratch.blurred);
}

}  // namespace

namespace kel {
namespace plain {

// Each output byte is written after the input byte at the same index was read, so the rows
// work in place.
size_t brighten(const uint8_t *in, size_t count, uint16_t percent, uint8_t *out) {
  for (size_t i = 0; i < count; ++i) out[i] = brightened(in[i], percent);
  return count;
}

size_t darken(const uint8_t *in, size_t count, uint16_t percent, uint8_t *out) {
  for (size_t i = 0; i < count; ++i) out[i] = darkened(in[i], percent);
  return count;
}

size_t mask(const uint8_t *in, size_t count, uint8_t key, uint8_t *out) {
  for (size_t i = 0; i < count; ++i) out[i] = in[i] == key ? 0 : 1;
  return count;
}

// memmove reads ahead, which gives the in-order result unless the destination starts inside
// the source.
size_t copy(const uint8_t *in, size_t count, uint8_t *out) {
  if (starts_inside(out, in, count)) {
    copy_in_order(in, count, out);
  } else if (count != 0) {
    std::memmove(out, in, count);
  }
  return count;
}

size_t blend(const uint8_t *in, size_t count, uint8_t *out) {
  for (size_t i = 0; i < count; ++i) out[i] = blended(out[i], in[i]);
  return count;
}

// Each source pixel is read just before its destination pixel is written.
size_t paste_keyed(const uint8_t *in, size_t count, uint8_t key, uint8_t *out) {
  for (size_t i = 0; i < count; ++i) {
    const uint8_t value = in[i];
    if (value != key) out[i] = value;
  }
  return count;
}

size_t blend_keyed(const uint8_t *in, size_t count, uint8_t key, uint8_t *out) {
  for (size_t i = 0; i < count; ++i) {
    const uint8_t value = in[i];
    if (value != key) out[i] = blended(out[i], value);
  }
  return count;
}

// Microcontrollers have no cache to fill ahead.
void prefetch_for_writing(uintptr_t, size_t) {}

// Backwards a block at a time while the blocks hold no zero, then byte by byte.
size_t nonzero_tail(const uint8_t *bytes, size_t count) {
  constexpr size_t kBlock = 64;
  size_t end = count;
  while (end > kBlock && !holds(bytes + end - kBlock, kBlock, 0)) end -= kBlock;
  while (end > 0 && bytes[end - 1] != 0) --end;
  return count - end;
}

}  // namespace plain
}  // namespace kel

extern "C" {

void kel_image_brighten(const uint8_t *src, uint32_t height, uint32_t width, uint32_t percent,
                        uint8_t *dst) {
  const uint32_t count = pixel_count(height, width);
  kel::run_row(&kel::Kernels::brighten, kel::kernels(), src, count, clamp_percent(percent), dst);
}

void kel_image_darken(const uint8_t *src, uint32_t height, uint32_t width, uint32_t percent,
                      uint8_t *dst) {
  const uint32_t count = pixel_count(height, width);
  kel::run_row(&kel::Kernels::darken, kel::kernels(), src, count, clamp_percent(percent), dst);
}

void kel_get_mask(const uint8_t *src, uint32_t height, uint32_t width, int32_t key, uint8_t *mask) {
  const uint32_t count = pixel_count(height, width);
  if (count == 0) return;
  // A key no byte can hold equals no pixel: the mask is all 1 whatever the image holds.
  if (key < 0 || key > 255) {
    std::memset(mask, 1, count);
    return;
  }
  kel::run_row(&kel::Kernels::mask, kel::kernels(), src, count, static_cast<uint8_t>(key), mask);
}

void kel_image_draw_image(uint8_t *dst, int32_t dst_height, int32_t dst_width, const uint8_t *src,
                          uint16_t src_height, uint16_t src_width, int32_t x, int32_t y,
                          uint16_t key) {
  composite(kPaste, dst, dst_height, dst_width, src, src_height, src_width, x, y, key);
}

void kel_image_blend_image(uint8_t *dst, int32_t dst_height, int32_t dst_width, const uint8_t *src,
                           uint16_t src_height, uint16_t src_width, int32_t x, int32_t y,
                           uint16_t key) {
  composite(kBlend, dst, dst_height, dst_width, src, src_height, src_width, x, y, key);
}

void kel_mask_image(const uint8_t *src, uint16_t height, uint16_t width, const uint8_t *mask,
                    uint8_t *dst) {
  if (height > kMaxFillSide || width > kMaxFillSide) return;
  fill_from_heap(src, fill_sizes(height, width), mask, dst);
}

size_t kel_mask_image_scratch_size(uint16_t height, uint16_t width) {
  if (height > kMaxFillSide || width > kMaxFillSide) return 0;
  return scratch_bytes_for(fill_sizes(height, width));
}

void kel_mask_image_into(const uint8_t *src, uint16_t height, uint16_t width, const uint8_t *mask,
                         uint8_t *dst, void *scratch, size_t scratch_bytes) {
  const size_t needed = kel_mask_image_scratch_size(height, width);
  if (needed == 0 || scratch == nullptr || scratch_bytes < needed) return;
  const FillSizes sizes = fill_sizes(height, width);
  fill_masked(src, sizes, mask, dst, carve(sizes, scratch));
}

}  // extern "C"
