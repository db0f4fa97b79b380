// Drawing into plain rasters: lines, triangle outlines, rectangle outlines, octagonal circles and
// decimal numbers.
//
// Every figure is computed from its own parameters in 64-bit positions, and every pixel goes
// through Raster::plot, the one place that decides what lands in the raster. So that the work
// follows what is drawn rather than the size of the figure, each loop first narrows its range
// of steps to those whose pixels can land inside; the pixels written, and the order in which
// they are written, are still exactly those of the whole figure.
#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <utility>

#include "kel_images.h"

namespace {

// The one place that decides whether a figure's pixel lands in the raster. All four comparisons
// are signed, so a raster with height <= 0 or width <= 0 receives nothing.
struct Raster {
  uint8_t *pixels;
  int32_t height, width;

  bool has_column(int64_t x) const { return x >= 0 && x < width; }
  bool has_row(int64_t y) const { return y >= 0 && y < height; }

  void plot(int64_t x, int64_t y, uint8_t colour) const {
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
  Steps intersect(Steps other) const {
    return {std::max(begin, other.begin), std::min(end, other.end)};
  }
  // The smallest range holding both; an empty range adds nothing.
  Steps span(Steps other) const {
    if (empty()) return other;
    if (other.empty()) return *this;
    return {std::min(begin, other.begin), std::max(end, other.end)};
  }
};

// The steps k at which the coordinate start + direction * k (direction +1 or -1) lies in
// [0, extent). Empty when extent <= 0.
Steps steps_inside(int64_t start, int64_t direction, int32_t extent) {
  if (direction > 0) return {-start, extent - start};
  return {start - extent + 1, start + 1};
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
  int64_t major_start, major_direction;
  int64_t minor_start, minor_direction;
  uint64_t major_length, minor_length;

  uint64_t minor_offset(int64_t i) const {
    return static_cast<uint64_t>(i) * minor_length / major_length;
  }
  // The minor coordinate times minor_direction: nondecreasing in i, so clipping can search it.
  int64_t minor_progress(int64_t i) const {
    return minor_direction * minor_start + static_cast<int64_t>(minor_offset(i));
  }
  void plot(const Raster &raster, int64_t i, uint64_t offset, uint8_t colour) const {
    const int64_t major = major_start + major_direction * i;
    const int64_t minor = minor_start + minor_direction * static_cast<int64_t>(offset);
    if (steep) {
      raster.plot(minor, major, colour);
    } else {
      raster.plot(major, minor, colour);
    }
  }
};

// The first step of a nonempty range whose minor progress reaches target; steps.end if none.
int64_t first_step_reaching(const LineInterior &line, Steps steps, int64_t target) {
  // Most lines lie wholly on one side of a raster edge: settle those without a search.
  if (line.minor_progress(steps.begin) >= target) return steps.begin;
  if (line.minor_progress(steps.end - 1) < target) return steps.end;
  int64_t low = steps.begin + 1, high = steps.end - 1;
  while (low < high) {
    const int64_t middle = low + (high - low) / 2;
    if (line.minor_progress(middle) >= target) {
      high = middle;
    } else {
      low = middle + 1;
    }
  }
  return low;
}

// The interior steps whose pixels lie inside the raster on both axes.
Steps interior_steps_inside(const LineInterior &line, const Raster &raster) {
  const int32_t major_extent = line.steep ? raster.height : raster.width;
  const int32_t minor_extent = line.steep ? raster.width : raster.height;
  const Steps interior{1, static_cast<int64_t>(line.major_length)};
  const Steps steps =
      interior.intersect(steps_inside(line.major_start, line.major_direction, major_extent));
  if (steps.empty()) return steps;
  // Inside on the minor axis means a progress in [first, past): [0, extent) going forward,
  // [1 - extent, 1) going backward.
  const int64_t first = line.minor_direction > 0 ? 0 : 1 - int64_t{minor_extent};
  const int64_t past = line.minor_direction > 0 ? int64_t{minor_extent} : 1;
  return {first_step_reaching(line, steps, first), first_step_reaching(line, steps, past)};
}

void draw_line_interior(const Raster &raster, const LineInterior &line, uint8_t colour) {
  const Steps steps = interior_steps_inside(line, raster);
  if (steps.empty()) return;
  // i * minor_length = quotient * major_length + remainder, carried from step to step: one
  // division for the first pixel inside, then an addition per pixel. minor_length <=
  // major_length, so a step carries at most once.
  uint64_t quotient = line.minor_offset(steps.begin);
  uint64_t remainder =
      static_cast<uint64_t>(steps.begin) * line.minor_length - quotient * line.major_length;
  for (int64_t i = steps.begin; i < steps.end; ++i) {
    line.plot(raster, i, quotient, colour);
    remainder += line.minor_length;
    if (remainder >= line.major_length) {
      remainder -= line.major_length;
      ++quotient;
    }
  }
}

uint64_t magnitude(int64_t value) {
  return value < 0 ? static_cast<uint64_t>(-value) : static_cast<uint64_t>(value);
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
  const int64_t dx_direction = dx < 0 ? -1 : 1;
  const uint64_t run = magnitude(dx), rise = static_cast<uint64_t>(dy);
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
  // Top and bottom edges own the corners; the sides cover only the rows strictly between. An edge
  // pair whose rows (or columns) both miss the raster is skipped whole, so the work follows what
  // is drawn.
  if (raster.has_row(y) || raster.has_row(bottom)) {
    const Steps columns = Steps{0, int64_t{rect_width}}.intersect(steps_inside(x, 1, raster.width));
    for (int64_t k = columns.begin; k < columns.end; ++k) {
      raster.plot(x + k, y, colour);
      raster.plot(x + k, bottom, colour);
    }
  }
  if (rect_height < 3 || !(raster.has_column(x) || raster.has_column(right))) return;
  const Steps rows =
      Steps{1, int64_t{rect_height} - 1}.intersect(steps_inside(y, 1, raster.height));
  for (int64_t k = rows.begin; k < rows.end; ++k) {
    raster.plot(x, y + k, colour);
    raster.plot(right, y + k, colour);
  }
}

// ---- Numbers -----------------------------------------------------------------------------------

// Each digit is a 4 x 7 cell; pixel p lies in column p % 4 and row p / 4, drawn in list order.
constexpr int32_t kGlyphColumns = 4;
constexpr int32_t kGlyphAdvance = 5;  // one column of box margin shared between neighbours
constexpr uint8_t kGlyphPixelCounts[10] = {14, 11, 12, 12, 13, 13, 14, 10, 14, 14};
constexpr int8_t kGlyphPixels[10][14] = {
    {1, 2, 4, 7, 8, 11, 12, 15, 16, 19, 20, 23, 25, 26},
    {2, 5, 6, 10, 14, 18, 22, 24, 25, 26, 27, -1, -1, -1},
    {1, 2, 4, 7, 11, 14, 17, 20, 24, 25, 26, 27, -1, -1},
    {1, 2, 4, 7, 11, 14, 16, 19, 20, 23, 25, 26, -1, -1},
    {3, 6, 7, 9, 11, 12, 15, 16, 17, 18, 19, 23, 27, -1},
    {0, 1, 2, 3, 4, 8, 13, 14, 19, 23, 24, 25, 26, -1},
    {1, 2, 4, 7, 8, 12, 13, 14, 16, 19, 20, 23, 25, 26},
    {0, 1, 2, 3, 7, 10, 13, 17, 21, 25, -1, -1, -1, -1},
    {1, 2, 4, 7, 8, 11, 13, 14, 16, 19, 20, 23, 25, 26},
    {1, 2, 4, 7, 8, 11, 13, 14, 15, 19, 20, 23, 25, 26},
};
// Place values of the nine digit positions, units first.
constexpr int32_t kPlaceValues[9] = {1, 10, 100, 1000, 10000, 100000, 1000000, 10000000, 100000000};
// The most a nine-digit display shows. Larger magnitudes show as all nines rather than as a
// wrong number, and never index past the glyph table.
constexpr int32_t kLargestShown = 999999999;

// The 6 x 9 background box around the glyph cell at (pen, y), column by column, then the glyph.
void draw_digit(const Raster &raster, int32_t digit, int64_t pen, int64_t y, uint8_t colour) {
  const uint8_t background = static_cast<uint8_t>(255 - colour);
  for (int64_t column = pen - 1; column <= pen + kGlyphColumns; ++column) {
    for (int64_t row = y - 1; row <= y + 7; ++row) raster.plot(column, row, background);
  }
  for (int32_t k = 0; k < kGlyphPixelCounts[digit]; ++k) {
    const int32_t p = kGlyphPixels[digit][k];
    raster.plot(pen + p % kGlyphColumns, y + p / kGlyphColumns, colour);
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
  for (int32_t position = 9; position >= 1; --position) {
    const int32_t place = kPlaceValues[position - 1];
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
  const int64_t d = diameter;
  const int64_t half = d / 2;
  const int64_t edge = half + kEdgeAdjustment[(d - 3) % 4];
  const int64_t corner = (d + 2 - edge) / 2;
  const int64_t diagonal = corner > 2 ? corner - 2 : 0;
  // Even sizes put the anchor at the top-left of the four central pixels.
  const int64_t left = x - half + (d % 2 == 0), top = y - half + (d % 2 == 0);
  const int64_t right = left + d - 1, bottom = top + d - 1;
  const int64_t edge_x = x - edge / 2 + (edge % 2 == 0), edge_y = y - edge / 2 + (edge % 2 == 0);
  const int64_t edge_y_last = edge_y + edge - 1;

  const Steps along_edge{0, edge};
  const bool rows_missed = !(raster.has_row(top) || raster.has_row(bottom));
  const bool columns_missed = !(raster.has_column(left) || raster.has_column(right));
  const Steps columns =
      rows_missed ? Steps{0, 0} : along_edge.intersect(steps_inside(edge_x, 1, raster.width));
  for (int64_t k = columns.begin; k < columns.end; ++k) {
    raster.plot(edge_x + k, top, colour);
    raster.plot(edge_x + k, bottom, colour);
  }
  const Steps rows =
      columns_missed ? Steps{0, 0} : along_edge.intersect(steps_inside(edge_y, 1, raster.height));
  for (int64_t k = rows.begin; k < rows.end; ++k) {
    raster.plot(left, edge_y + k, colour);
    raster.plot(right, edge_y + k, colour);
  }
  // Step j of the diagonals writes the four corners of a box: columns left + j and right - j,
  // rows edge_y - j and edge_y_last + j. For j <= s every left column lies left of every right
  // one (the horizontal edges lie between them), and every upper row above every lower one. The
  // raster's columns being one interval, the j at which a left or a right column is inside form
  // one interval, the span of the two; likewise for rows. Walking the j in both keeps the order
  // of the writes and skips every j whose four pixels all land outside.
  const Steps along_diagonal{1, diagonal + 1};
  const Steps some_column_inside =
      along_diagonal.intersect(steps_inside(left, 1, raster.width))
          .span(along_diagonal.intersect(steps_inside(right, -1, raster.width)));
  const Steps some_row_inside =
      along_diagonal.intersect(steps_inside(edge_y, -1, raster.height))
          .span(along_diagonal.intersect(steps_inside(edge_y_last, 1, raster.height)));
  const Steps steps = some_column_inside.intersect(some_row_inside);
  for (int64_t j = steps.begin; j < steps.end; ++j) {
    raster.plot(left + j, edge_y - j, colour);
    raster.plot(right - j, edge_y - j, colour);
    raster.plot(left + j, edge_y_last + j, colour);
    raster.plot(right - j, edge_y_last + j, colour);
  }
}

}  // namespace

extern "C" {

void kel_image_draw_line(uint8_t *buf, int32_t height, int32_t width, int32_t x0, int32_t y0,
                         int32_t x1, int32_t y1, uint8_t colour) {
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
  draw_rectangle(Raster{buf, height, width}, x, y, rect_width, rect_height, colour);
}

void kel_image_draw_number(uint8_t *buf, int32_t height, int32_t width, int32_t value,
                           uint8_t min_digits, int32_t x, int32_t y, uint8_t colour) {
  draw_number(Raster{buf, height, width}, value, min_digits, x, y, colour);
}

void kel_image_draw_circle(uint8_t *buf, int32_t height, int32_t width, uint32_t diameter,
                           int32_t x, int32_t y, uint8_t colour) {
  draw_circle(Raster{buf, height, width}, diameter, x, y, colour);
}

}  // extern "C"
