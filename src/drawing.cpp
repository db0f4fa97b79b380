// Drawing into plain rasters: lines, triangle outlines, rectangle outlines, octagonal circles and
// decimal numbers.
//
// Every figure is computed from its own parameters in 64-bit positions. A lone pixel goes
// through Raster::plot; a straight run of pixels (an edge, a diagonal, a line's interior) first
// narrows its range of steps to those that land inside on both axes, and then writes that range
// without testing each pixel. So the work follows what is drawn rather than the size of the
// figure, and the pixels written are exactly those of the whole figure. Every pixel of a call
// gets the same value (or a digit's box its background before the glyph), so the order of the
// writes within a run or an edge is not visible.
#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <utility>

#include "kel_images.h"
#include "wide_division.h"

namespace {

// The one place that decides whether a figure's pixel lands in the raster. A raster has rows and
// columns: the routines return before making one of a raster with height <= 0 or width <= 0,
// which receives nothing. So a position is inside when, read as unsigned, it is below the size:
// a negative one reads as a larger number than any size.
struct Raster {
  uint8_t *pixels;
  int32_t height, width;

  bool has_column(int64_t x) const {
    return static_cast<uint64_t>(x) < static_cast<uint64_t>(width);
  }
  bool has_row(int64_t y) const { return static_cast<uint64_t>(y) < static_cast<uint64_t>(height); }
  // The same for the 32-bit positions of the public calls.
  bool has_column(int32_t x) const {
    return static_cast<uint32_t>(x) < static_cast<uint32_t>(width);
  }
  bool has_row(int32_t y) const { return static_cast<uint32_t>(y) < static_cast<uint32_t>(height); }

  template <typename Position>
  void plot(Position x, Position y, uint8_t colour) const {
    if (has_column(x) && has_row(y)) {
      // y * width + x < height * width, the size of the caller's buffer, so it fits size_t.
      pixels[static_cast<size_t>(y) * static_cast<size_t>(width) + static_cast<size_t>(x)] = colour;
    }
  }
};

// A half-open range [begin, end) of step numbers along a figure.
struct Steps {
  int64_t begin, end;

  bool empty() const { return begin >= end; }

  // Keeps the steps k at which the coordinate start + direction * k (direction -1, 0 or +1)
  // lies in [0, extent); none when extent <= 0.
  void keep_inside(int64_t start, int32_t direction, int32_t extent) {
    int64_t low = -start, high = extent - start;  // going forward
    if (direction < 0) low = start - extent + 1, high = start + 1;
    if (direction == 0) {
      if (start >= 0 && start < extent) return;
      low = high = 0;
    }
    begin = std::max(begin, low);
    end = std::min(end, high);
  }
};

// count >= 1 pixels from buffer index `first` on, `stride` apart (modulo 2^32 on a 32-bit
// core, so a negative stride wraps), all inside the raster: a row (stride 1) is one memset.
__attribute__((noinline)) void write_run(uint8_t *pixels, size_t first, size_t count, size_t stride,
                                         uint8_t colour) {
  if (stride == 1) {
    std::memset(pixels + first, colour, count);
    return;
  }
  do {
    pixels[first] = colour;
    first += stride;
  } while (--count != 0);
}

// The pixels (x + k * step_x, y + k * step_y) for the steps k in `along`, step_x and step_y each
// -1, 0 or +1: a row, a column or a diagonal. Those inside form one range of k.
void draw_run(const Raster &raster, int64_t x, int64_t y, int32_t step_x, int32_t step_y,
              const Steps &along, uint8_t colour) {
  Steps inside = along;
  inside.keep_inside(x, step_x, raster.width);
  inside.keep_inside(y, step_y, raster.height);
  if (inside.empty()) return;
  // Inside the raster, positions and buffer indices fit size_t (and 32 bits on a 32-bit core).
  const auto begin = static_cast<size_t>(inside.begin);
  const auto count = static_cast<size_t>(inside.end - inside.begin);
  const auto width = static_cast<size_t>(raster.width);
  size_t first = (static_cast<size_t>(y) + static_cast<size_t>(step_y) * begin) * width +
                 static_cast<size_t>(x) + static_cast<size_t>(step_x) * begin;
  size_t stride = static_cast<size_t>(step_y) * width + static_cast<size_t>(step_x);
  if (step_y == 0 && step_x < 0) first -= count - 1, stride = 1;  // a row leftward, rightward
  write_run(raster.pixels, first, count, stride, colour);
}

// ---- Lines -------------------------------------------------------------------------------------

// The pixels strictly between a line's end points. Step i (1 <= i < major_length) lies at
// major_start + major_direction * i on the major axis and at
// minor_start + minor_direction * floor(i * minor_length / major_length) on the minor axis. With
// the start at the smaller row this is the line's rule in both cases: a steep line's column
// offset truncates toward zero, and a flat line's row offset is never negative.
//
// The end points are 32-bit, so both lengths are below 2^32, and minor_length <= major_length
// keeps i * minor_length below 2^64: every line is drawn exactly, whatever its end points.
struct LineInterior {
  bool steep;  // the major axis is the row
  int64_t major_start;
  int32_t major_direction;
  int64_t minor_start;
  int32_t minor_direction;
  uint32_t major_length, minor_length;

  // floor(i * minor_length / major_length) and what it leaves over.
  kel::WideQuotient minor_offset(int64_t i) const {
    return kel::divide_wide(static_cast<uint64_t>(i) * minor_length, major_length);
  }
};

// The first step of a nonempty range whose minor progress (the minor coordinate times
// minor_direction, nondecreasing along the line) reaches target; steps.end if none. The offset
// floor(i * minor / major) reaches t > 0 exactly when i * minor >= t * major, so the step is ceil(t
// * major / minor). Both t and major_length are below 2^32, so the product stays below 2^64.
__attribute__((noinline)) int64_t first_step_reaching(const LineInterior &line, const Steps &steps,
                                                      int64_t target) {
  const int64_t needed = target - line.minor_direction * line.minor_start;
  if (needed <= 0) return steps.begin;
  if (line.minor_length == 0) return steps.end;
  const kel::WideQuotient whole =
      kel::divide_wide(static_cast<uint64_t>(needed) * line.major_length, line.minor_length);
  const uint64_t step = whole.quotient + (whole.remainder != 0 ? 1 : 0);
  if (step >= static_cast<uint64_t>(steps.end)) return steps.end;
  return std::max(steps.begin, static_cast<int64_t>(step));
}

// The interior steps whose pixels lie inside the raster on both axes.
Steps interior_steps_inside(const LineInterior &line, const Raster &raster) {
  const int32_t major_extent = line.steep ? raster.height : raster.width;
  const int32_t minor_extent = line.steep ? raster.width : raster.height;
  Steps steps{1, static_cast<int64_t>(line.major_length)};
  steps.keep_inside(line.major_start, line.major_direction, major_extent);
  if (steps.empty()) return steps;
  // Inside on the minor axis means a progress in [first, past): [0, extent) going forward,
  // [1 - extent, 1) going backward.
  const int64_t first = line.minor_direction > 0 ? 0 : 1 - int64_t{minor_extent};
  const int64_t past = line.minor_direction > 0 ? int64_t{minor_extent} : 1;
  return {first_step_reaching(line, steps, first), first_step_reaching(line, steps, past)};
}

// count >= 1 pixels of a line, the first at `at`: one major step each, and one minor step where
// the offset carries. excess is the remainder minus major_length, modulo 2^32: adding
// minor_length carries out of 32 bits exactly when the offset carries, and the remainder then
// drops by major_length again. (A branch-free carry measured slower on the host: it lengthens
// the chain from one step to the next, and the carries of a line repeat in a pattern that branch
// prediction follows.) Steps wrap modulo 2^32 for the negative directions; the pointer moves
// only between pixels of the line, all inside the raster, but for the step after the last.
__attribute__((noinline)) void step_line(uint8_t *at, uint32_t count, size_t major_step,
                                         size_t minor_step, uint32_t excess, uint32_t minor_length,
                                         uint32_t major_length, uint8_t colour) {
  uintptr_t address = reinterpret_cast<uintptr_t>(at);
  do {
    *reinterpret_cast<uint8_t *>(address) = colour;
    excess += minor_length;
    if (excess < minor_length) {
      address += minor_step;
      excess -= major_length;
    }
    address += major_step;
  } while (--count != 0);
}

inline void draw_line_interior(const Raster &raster, const LineInterior &line, uint8_t colour) {
  const Steps steps = interior_steps_inside(line, raster);
  if (steps.empty()) return;
  // i * minor_length = quotient * major_length + remainder: one division for the first pixel
  // inside, then the offset carries by at most one per step (minor_length <= major_length).
  const kel::WideQuotient offset = line.minor_offset(steps.begin);
  const int64_t width = raster.width;
  const int64_t major = line.major_start + line.major_direction * steps.begin;
  const int64_t minor =
      line.minor_start + line.minor_direction * static_cast<int64_t>(offset.quotient);
  // Every pixel of the range lies inside, so its buffer index is below height * width and the
  // loop steps it in size_t, strides wrapping for the negative directions: 32-bit work on a
  // 32-bit core, whatever the line's coordinates. Fewer than major_length steps, so the count
  // fits 32 bits.
  const size_t at = static_cast<size_t>(line.steep ? major * width + minor : minor * width + major);
  const auto major_stride = static_cast<size_t>(line.major_direction);
  const auto minor_stride = static_cast<size_t>(line.minor_direction);
  const auto width_stride = static_cast<size_t>(width);
  step_line(raster.pixels + at, static_cast<uint32_t>(steps.end - steps.begin),
            line.steep ? width_stride : major_stride, line.steep ? minor_stride : width_stride,
            offset.remainder - line.major_length, line.minor_length, line.major_length, colour);
}

// |value| of a difference of two 32-bit coordinates, below 2^32.
uint32_t magnitude(int64_t value) {
  return static_cast<uint32_t>(value < 0 ? -value : value);
}

void draw_line(const Raster &raster, int64_t x0, int64_t y0, int64_t x1, int64_t y1,
               uint8_t colour) {
  raster.plot(x0, y0, colour);
  raster.plot(x1, y1, colour);
  // Start from the end point with the smaller row; on one row, from the first one given.
  if (y0 > y1) {
    std::swap(x0, x1);
    std::swap(y0, y1);
  }
  const int64_t dx = x1 - x0, dy = y1 - y0;
  if (dx == 0 && dy == 0) return;
  const int32_t dx_direction = dx < 0 ? -1 : 1;
  const uint32_t run = magnitude(dx), rise = static_cast<uint32_t>(dy);
  if (rise > run) {
    draw_line_interior(raster, {true, y0, 1, x0, dx_direction, rise, run}, colour);
  } else {
    draw_line_interior(raster, {false, x0, dx_direction, y0, 1, run, rise}, colour);
  }
}

// ---- Rectangles --------------------------------------------------------------------------------

void draw_rectangle(const Raster &raster, int64_t x, int64_t y, uint32_t rect_width,
                    uint32_t rect_height, uint8_t colour) {
  const int64_t right = x + int64_t{rect_width} - 1;
  const int64_t bottom = y + int64_t{rect_height} - 1;
  // Top and bottom edges own the corners; the sides cover only the rows strictly between.
  const Steps columns{0, int64_t{rect_width}};
  draw_run(raster, x, y, 1, 0, columns, colour);
  draw_run(raster, x, bottom, 1, 0, columns, colour);
  if (rect_height < 3) return;
  const Steps rows{1, int64_t{rect_height} - 1};
  draw_run(raster, x, y, 0, 1, rows, colour);
  draw_run(raster, right, y, 0, 1, rows, colour);
}

// ---- Numbers -----------------------------------------------------------------------------------

// Each digit is a 4 x 7 cell.
constexpr int32_t kGlyphColumns = 4;
constexpr int32_t kGlyphAdvance = 5;  // one column of box margin shared between neighbours
// Glyph pixel p (column p % 4, row p / 4) is bit p of its digit's mask. Every glyph's pixels are
// drawn in increasing index order, so walking the bits from the lowest keeps the drawing order,
// and ten words hold the whole font. Read from the right, each hex digit is one glyph row, its
// lowest bit the left column.
constexpr uint32_t kGlyphMasks[10] = {
    0x6999996,  // 0
    0xF444464,  // 1
    0xF124896,  // 2
    0x6994896,  // 3
    0x88F9AC8,  // 4
    0x788611F,  // 5
    0x6997196,  // 6
    0x222248F,  // 7
    0x6996996,  // 8
    0x698E996,  // 9
};
// The most a nine-digit display shows. Larger magnitudes show as all nines rather than as a
// wrong number, and never index past the glyph table.
constexpr int32_t kLargestShown = 999999999;

// Four bytes in memory order, byte k 0xFF where bit k of `bits` (0 .. 15) is set and 0
// elsewhere: the four bits' copies land eight bits apart without carries, then each 1 becomes
// 0xFF.
uint32_t spread_bits(uint32_t bits) {
#if defined(__BYTE_ORDER__) && __BYTE_ORDER__ == __ORDER_BIG_ENDIAN__
  bits = ((bits & 1) << 3) | ((bits & 2) << 1) | ((bits & 4) >> 1) | ((bits & 8) >> 3);
#endif
  return ((bits * 0x204081u) & 0x01010101u) * 0xFFu;
}

// The 6 x 9 background box around the glyph cell at (pen, y), then the glyph. Box and glyph
// each have one colour, so only their order shows, not the order within them: each row of the
// box is written as the two leave it, the glyph's four pixels of the row one word, colour where
// its bits are set and background elsewhere, and a row that lies whole inside in one copy.
void draw_digit(const Raster &raster, int32_t digit, int64_t pen, int64_t y, uint8_t colour) {
  constexpr int64_t kBoxColumns = kGlyphColumns + 2;
  const uint8_t background = static_cast<uint8_t>(255 - colour);
  const uint32_t mask = kGlyphMasks[digit];
  const uint32_t fill = background * 0x01010101u, change = (background ^ colour) * 0x01010101u;
  // The box's columns that land inside: [first, past) of those from pen - 1.
  const int64_t left = pen - 1;
  const int64_t first = left < 0 ? -left : 0;
  const int64_t past = raster.width - left < kBoxColumns ? raster.width - left : kBoxColumns;
  if (first >= past) return;
  for (int32_t row = -1; row <= 7; ++row) {
    if (!raster.has_row(y + row)) continue;
    const uint32_t bits = row < 0 || row > 6 ? 0 : (mask >> (kGlyphColumns * row)) & 15u;
    const uint32_t glyph = fill ^ (spread_bits(bits) & change);
    uint8_t cells[kBoxColumns] = {background, 0, 0, 0, 0, background};
    std::memcpy(cells + 1, &glyph, 4);
    // Inside the raster, so the index fits size_t.
    std::memcpy(raster.pixels + static_cast<size_t>(y + row) * static_cast<size_t>(raster.width) +
                    static_cast<size_t>(left + first),
                cells + first, static_cast<size_t>(past - first));
  }
}

void draw_number(const Raster &raster, int32_t value, uint8_t min_digits, int64_t x, int64_t y,
                 uint8_t colour) {
  int32_t rest = std::clamp(value, -kLargestShown, kLargestShown);
  int64_t pen = x;
  if (rest < 0) {
    // The minus sign takes a digit step of its own but has no background box.
    raster.plot(pen + 1, y + 3, colour);
    raster.plot(pen + 2, y + 3, colour);
    rest = -rest;
    pen += kGlyphAdvance;
  }
  bool started = false;
  int32_t place = 100000000;  // of the ninth digit, the most shown
  for (int32_t position = 9; position >= 1; --position, place /= 10) {
    const int32_t digit = rest / place;
    if (digit != 0) {
      started = true;
    } else if (!started && min_digits < position) {
      continue;  // a leading zero beyond min_digits: nothing drawn, the pen stays
    }
    draw_digit(raster, digit, pen, y, colour);
    rest -= digit * place;
    pen += kGlyphAdvance;
  }
}

// ---- Circles -----------------------------------------------------------------------------------

// Straight edge length minus floor(d / 2), indexed by (d - 3) % 4.
constexpr int8_t kEdgeAdjustment[4] = {0, 0, 1, -1};
// The runs of an octagon: edges first (top, bottom, left, right), then the diagonals from the
// left and right edges up and down. Each has its steps and its start, as indices into the
// columns {edge_x, left, right} and the rows {top, bottom, edge_y, edge_y_last}.
struct CircleRun {
  int8_t step_x, step_y, column, row;
};
constexpr CircleRun kCircleRuns[8] = {{1, 0, 0, 0},  {1, 0, 0, 1},   {0, 1, 1, 2}, {0, 1, 2, 2},
                                      {1, -1, 1, 2}, {-1, -1, 2, 2}, {1, 1, 1, 3}, {-1, 1, 2, 3}};

// An octagon that fills a d x d box: four straight edges of L pixels and four diagonal runs of
// s pixels, with L + 2 * (s + 1) = d.
void draw_circle(const Raster &raster, uint32_t diameter, int64_t x, int64_t y, uint8_t colour) {
  if (diameter == 0) return;
  if (diameter <= 2) {
    raster.plot(x, y, colour);
    if (diameter == 1) return;
    raster.plot(x + 1, y, colour);
    raster.plot(x, y + 1, colour);
    raster.plot(x + 1, y + 1, colour);
    return;
  }
  // The sizes in 32 bits: each is at most the diameter.
  const uint32_t half = diameter / 2;
  const uint32_t edge = half + static_cast<uint32_t>(kEdgeAdjustment[(diameter - 3) % 4]);
  const uint32_t corner = (diameter - edge) / 2 + 1;
  const uint32_t diagonal = corner > 2 ? corner - 2 : 0;
  const int64_t even = diameter % 2 == 0, edge_even = edge % 2 == 0;
  // Even sizes put the anchor at the top-left of the four central pixels.
  const int64_t left = x - half + even, top = y - half + even;
  const int64_t right = left + diameter - 1, bottom = top + diameter - 1;
  const int64_t edge_x = x - edge / 2 + edge_even, edge_y = y - edge / 2 + edge_even;
  const int64_t edge_y_last = edge_y + edge - 1;

  // Each j of a diagonal is one step of its run.
  const int64_t columns[] = {edge_x, left, right}, rows[] = {top, bottom, edge_y, edge_y_last};
  const Steps along_edge{0, edge};
  const Steps along_diagonal{1, int64_t{diagonal} + 1};
  // Unrolled where speed counts, each run then sees its constant steps: a third fewer
  // instructions per circle. Builds for size keep the loop.
#if !KEL_SMALL_BUILD
#pragma GCC unroll 8
#endif
  for (const CircleRun &run : kCircleRuns) {
    draw_run(raster, columns[run.column], rows[run.row], run.step_x, run.step_y,
             &run < kCircleRuns + 4 ? along_edge : along_diagonal, colour);
  }
}

}  // namespace

extern "C" {

void kel_image_draw_line(uint8_t *buf, int32_t height, int32_t width, int32_t x0, int32_t y0,
                         int32_t x1, int32_t y1, uint8_t colour) {
  if (height <= 0 || width <= 0) return;
  draw_line(Raster{buf, height, width}, x0, y0, x1, y1, colour);
}

void kel_image_draw_triangle(uint8_t *buf, int32_t height, int32_t width, int32_t x0, int32_t y0,
                             int32_t x1, int32_t y1, int32_t x2, int32_t y2, uint8_t colour) {
  kel_image_draw_line(buf, height, width, x0, y0, x1, y1, colour);
  kel_image_draw_line(buf, height, width, x1, y1, x2, y2, colour);
  kel_image_draw_line(buf, height, width, x2, y2, x0, y0, colour);
}

void kel_image_draw_rectangle(uint8_t *buf, int32_t height, int32_t width, int32_t x, int32_t y,
                              uint32_t rect_width, uint32_t rect_height, uint8_t colour) {
  if (height <= 0 || width <= 0) return;
  draw_rectangle(Raster{buf, height, width}, x, y, rect_width, rect_height, colour);
}

void kel_image_draw_number(uint8_t *buf, int32_t height, int32_t width, int32_t value,
                           uint8_t min_digits, int32_t x, int32_t y, uint8_t colour) {
  if (height <= 0 || width <= 0) return;
  draw_number(Raster{buf, height, width}, value, min_digits, x, y, colour);
}

void kel_image_draw_circle(uint8_t *buf, int32_t height, int32_t width, uint32_t diameter,
                           int32_t x, int32_t y, uint8_t colour) {
  if (height <= 0 || width <= 0) return;
  draw_circle(Raster{buf, height, width}, diameter, x, y, colour);
}

}  // extern "C"
