#include <gtest/gtest.h>

#include <algorithm>
#include <cstdint>
#include <functional>
#include <random>
#include <set>
#include <string>
#include <utility>
#include <vector>

#include "kel_images.h"
#include "test_support.h"

namespace {

using kel_test::Rows;
using Pixel = std::pair<int64_t, int64_t>;  // (x, y)
using Pixels = std::set<Pixel>;
using OnFigure = std::function<bool(int64_t x, int64_t y)>;
using Rng = std::mt19937_64;

constexpr uint8_t kInk = 'X';

// A raster of '.' between guard bytes, read back as rows ('o' for the ink's complement, a
// digit's box) or as the set of inked pixels.
struct Canvas : kel_test::Guarded {
  int32_t height, width;
  Canvas(int32_t h, int32_t w) : Guarded(size_t(h) * size_t(w), '.'), height(h), width(w) {}
  uint8_t at(int64_t x, int64_t y) const { return data()[y * width + x]; }
  Rows text() const {
    EXPECT_TRUE(guards_intact());
    Rows rows = kel_test::to_rows(data(), height, width);
    for (std::string &row : rows) std::replace(row.begin(), row.end(), char(255 - kInk), 'o');
    return rows;
  }
  Pixels inked() const {
    EXPECT_TRUE(guards_intact());
    Pixels out;
    for (int32_t y = 0; y < height; ++y) {
      for (int32_t x = 0; x < width; ++x) {
        if (at(x, y) == kInk) out.insert({x, y});
      }
    }
    return out;
  }
};

// Every pixel of the canvas is inked exactly when the figure's own rule says so.
void expect_figure(const Canvas &canvas, const OnFigure &on_figure) {
  Pixels expected;
  for (int32_t y = 0; y < canvas.height; ++y) {
    for (int32_t x = 0; x < canvas.width; ++x) {
      if (on_figure(x, y)) expected.insert({x, y});
    }
  }
  EXPECT_EQ(canvas.inked(), expected);
}

int32_t clamp32(int64_t v) {
  return int32_t(std::clamp<int64_t>(v, INT32_MIN, INT32_MAX));
}

// ---- References: each figure's rule asked pixel by pixel, products in 128 bits ----------------

// One position per value of the major coordinate, the minor offset by a division truncating
// toward zero, from the end point with the smaller row.
OnFigure on_line(int64_t x0, int64_t y0, int64_t x1, int64_t y1) {
  if (y0 > y1) std::swap(x0, x1), std::swap(y0, y1);
  return [=](int64_t x, int64_t y) {
    if ((x == x0 && y == y0) || (x == x1 && y == y1)) return true;
    const int64_t dx = x1 - x0, dy = y1 - y0, n = dx < 0 ? -dx : dx;
    if (dy > n) {
      const int64_t i = y - y0;
      return 0 < i && i < dy && x == x0 + int64_t(__int128(i) * dx / dy);
    }
    const int64_t i = dx < 0 ? x0 - x : x - x0;
    return 0 < i && i < n && y == y0 + int64_t(__int128(i) * dy / n);
  };
}

OnFigure on_rectangle(int64_t x, int64_t y, uint32_t rect_width, uint32_t rect_height) {
  const int64_t right = x + rect_width - 1, bottom = y + rect_height - 1;
  return [=](int64_t px, int64_t py) {
    return (rect_width != 0 && x <= px && px <= right && (py == y || py == bottom)) ||
           (rect_height >= 3 && y < py && py < bottom && (px == x || px == right));
  };
}

// The circle's lengths from the table by d mod 4: edges of L pixels, diagonals of s.
void circle_lengths(int64_t d, int64_t &edge, int64_t &diagonal) {
  edge = 2 * (d / 4) + d % 2;
  diagonal = d / 4 - 1 + (d % 4 >= 2);
}

// (u, v) relative to the d x d box: the edges start after the corner run of s + 1 steps.
bool on_circle_box(int64_t d, int64_t u, int64_t v) {
  if (d <= 2) return 0 <= u && u < d && 0 <= v && v < d;
  int64_t edge, diagonal;
  circle_lengths(d, edge, diagonal);
  const int64_t first = diagonal + 1, last = diagonal + edge;
  if ((v == 0 || v == d - 1) && first <= u && u <= last) return true;
  if ((u == 0 || u == d - 1) && first <= v && v <= last) return true;
  for (const int64_t j : {u, d - 1 - u}) {
    if (1 <= j && j <= diagonal && (v == first - j || v == last + j)) return true;
  }
  return false;
}

OnFigure on_circle(uint32_t d, int64_t x, int64_t y) {
  const int64_t reach = d == 0 ? 0 : (int64_t{d} - 1) / 2;
  return [=](int64_t px, int64_t py) { return on_circle_box(d, px - x + reach, py - y + reach); };
}

// ---- Lines, triangles and rectangles: the worked pixels -----------------------------------------

enum class Figure { kLine, kRectangle, kCircle };

// Lines take (x0, y0, x1, y1), rectangles (x, y, rect_width, rect_height), circles
// (diameter, x, y); each argument is clamped to its parameter's type.
void draw(Canvas &canvas, Figure figure, const int64_t p[4]) {
  uint8_t *b = canvas.data();
  const int32_t h = canvas.height, w = canvas.width;
  if (figure == Figure::kLine) {
    kel_image_draw_line(b, h, w, clamp32(p[0]), clamp32(p[1]), clamp32(p[2]), clamp32(p[3]), kInk);
  } else if (figure == Figure::kRectangle) {
    kel_image_draw_rectangle(b, h, w, clamp32(p[0]), clamp32(p[1]), uint32_t(p[2]), uint32_t(p[3]),
                             kInk);
  } else {
    kel_image_draw_circle(b, h, w, uint32_t(p[0]), clamp32(p[1]), clamp32(p[2]), kInk);
  }
}

OnFigure rule(Figure figure, const int64_t p[4]) {
  if (figure == Figure::kLine)
    return on_line(clamp32(p[0]), clamp32(p[1]), clamp32(p[2]), clamp32(p[3]));
  if (figure == Figure::kRectangle)
    return on_rectangle(clamp32(p[0]), clamp32(p[1]), uint32_t(p[2]), uint32_t(p[3]));
  return on_circle(uint32_t(p[0]), clamp32(p[1]), clamp32(p[2]));
}

constexpr Figure kLine = Figure::kLine, kRect = Figure::kRectangle;
constexpr int64_t kMin = INT32_MIN, kMax = INT32_MAX;

// On a 10 x 10 raster.
const struct {
  Figure figure;
  int64_t p[4];
  Pixels pixels;
} kWorked[] = {
    {kLine, {0, 0, 3, 1}, {{0, 0}, {3, 1}, {1, 0}, {2, 0}}},
    {kLine, {3, 1, 0, 0}, {{3, 1}, {0, 0}, {1, 0}, {2, 0}}},
    {kLine, {3, 0, 0, 4}, {{3, 0}, {0, 4}, {3, 1}, {2, 2}, {1, 3}}},
    {kLine, {3, 0, 0, 3}, {{3, 0}, {0, 3}, {2, 1}, {1, 2}}},
    {kLine,
     {9, 0, 0, 2},
     {{9, 0}, {0, 2}, {8, 0}, {7, 0}, {6, 0}, {5, 0}, {4, 1}, {3, 1}, {2, 1}, {1, 1}}},
    {kLine,
     {5, 0, 2, 9},
     {{5, 0}, {2, 9}, {5, 1}, {5, 2}, {4, 3}, {4, 4}, {4, 5}, {3, 6}, {3, 7}, {3, 8}}},
    {kLine, {4, 4, 4, 4}, {{4, 4}}},
    {kLine, {4, 4, 5, 5}, {{4, 4}, {5, 5}}},
    {kLine, {4, 4, 5, 4}, {{4, 4}, {5, 4}}},
    {kLine, {7, 5, 2, 5}, {{7, 5}, {2, 5}, {6, 5}, {5, 5}, {4, 5}, {3, 5}}},
    {kLine, {1, 0, 1, 6}, {{1, 0}, {1, 6}, {1, 1}, {1, 2}, {1, 3}, {1, 4}, {1, 5}}},
    {kLine, {1, 0, 0, 5}, {{1, 0}, {0, 5}, {1, 1}, {1, 2}, {1, 3}, {1, 4}}},
    {kLine, {0, 0, 3, 3}, {{0, 0}, {3, 3}, {1, 1}, {2, 2}}},
    // Clipped: neither end point is inside; the pixels inside are those of the whole line.
    {kLine, {-5, -5, 20, 14}, {{2, 0}, {3, 1}, {4, 1}, {5, 2}, {6, 3}, {7, 4}, {8, 4}, {9, 5}}},
    // Deltas and products beyond 32 bits are still the true line, here x + y = 5.
    {kLine, {kMax, kMin + 6, kMin + 6, kMax}, {{5, 0}, {4, 1}, {3, 2}, {2, 3}, {1, 4}, {0, 5}}},
    {kRect, {0, 0, 10, 10}, {}},  // the raster's border: checked as a picture below
    {kRect, {2, 3, 1, 1}, {{2, 3}}},
    {kRect, {2, 3, 1, 2}, {{2, 3}, {2, 4}}},
    {kRect, {2, 3, 2, 1}, {{2, 3}, {3, 3}}},
    {kRect, {2, 3, 1, 5}, {{2, 3}, {2, 4}, {2, 5}, {2, 6}, {2, 7}}},
    {kRect,
     {2, 3, 4, 3},
     {{2, 3}, {3, 3}, {4, 3}, {5, 3}, {2, 5}, {3, 5}, {4, 5}, {5, 5}, {2, 4}, {5, 4}}},
    {kRect, {2, 3, 4, 2}, {{2, 3}, {3, 3}, {4, 3}, {5, 3}, {2, 4}, {3, 4}, {4, 4}, {5, 4}}},
    {kRect, {-3, -3, 20, 20}, {}},
    {kRect, {9, 9, 5, 5}, {{9, 9}}},
    {kRect, {5, -2, 3, 5}, {{5, 2}, {6, 2}, {7, 2}, {5, 0}, {7, 0}, {5, 1}, {7, 1}}},
    {kRect, {2, 3, 0, 5}, {{2, 4}, {1, 4}, {2, 5}, {1, 5}, {2, 6}, {1, 6}}},
    {kRect, {2, 3, 0, 2}, {}},
    {kRect, {2, 3, 4, 0}, {{2, 3}, {3, 3}, {4, 3}, {5, 3}, {2, 2}, {3, 2}, {4, 2}, {5, 2}}},
    // x + rect_width passes 2^31: the right column lands at x + rect_width - 1 = 1.
    {kRect, {kMin, 7, 2147483650, 3}, {{0, 7}, {1, 7}, {1, 8}, {0, 9}, {1, 9}}},
};

TEST(Drawing, LinesAndRectanglesWriteExactlyTheirWorkedPixels) {
  for (const auto &c : kWorked) {
    SCOPED_TRACE(testing::Message() << (c.figure == kLine ? "line " : "rectangle ") << c.p[0] << ","
                                    << c.p[1] << " " << c.p[2] << "," << c.p[3]);
    Canvas canvas(10, 10);
    draw(canvas, c.figure, c.p);
    if (c.p[2] == 10) {
      EXPECT_EQ(canvas.text(),
                (Rows{"XXXXXXXXXX", "X........X", "X........X", "X........X", "X........X",
                      "X........X", "X........X", "X........X", "X........X", "XXXXXXXXXX"}));
    } else {
      EXPECT_EQ(canvas.inked(), c.pixels);
    }
  }
}

TEST(DrawTriangle, IsItsThreeLines) {
  const int32_t corners[][6] = {{1, 1, 8, 2, 4, 8}, {4, 4, 4, 4, 4, 4}, {-30, 2, 40, 9, 5, -70}};
  for (const auto &c : corners) {
    Canvas canvas(10, 10);
    kel_image_draw_triangle(canvas.data(), 10, 10, c[0], c[1], c[2], c[3], c[4], c[5], kInk);
    const OnFigure sides[] = {on_line(c[0], c[1], c[2], c[3]), on_line(c[2], c[3], c[4], c[5]),
                              on_line(c[4], c[5], c[0], c[1])};
    expect_figure(canvas, [&](int64_t x, int64_t y) {
      return sides[0](x, y) || sides[1](x, y) || sides[2](x, y);
    });
  }
}

// ---- Circles ------------------------------------------------------------------------------------

TEST(DrawCircle, DrawsTheWorkedPictures) {
  // Diameters 1 to 8 and 10 side by side, each box one column after the previous one.
  Canvas canvas(10, 55);
  int32_t left = 0;
  for (const uint32_t d : {1u, 2u, 3u, 4u, 5u, 6u, 7u, 8u, 10u}) {
    const int32_t reach = int32_t(d - 1) / 2;
    kel_image_draw_circle(canvas.data(), 10, 55, d, left + reach, reach, kInk);
    left += int32_t(d) + 1;
  }
  EXPECT_EQ(canvas.text(), (Rows{"X.XX..X...XX...XXX....XX.....XXX.....XXXX......XXXX....",
                                 "..XX.X.X.X..X.X...X..X..X...X...X...X....X....X....X...",
                                 "......X..X..X.X...X.X....X.X.....X.X......X..X......X..",
                                 "..........XX..X...X.X....X.X.....X.X......X.X........X.",
                                 "...............XXX...X..X..X.....X.X......X.X........X.",
                                 "......................XX....X...X..X......X.X........X.",
                                 ".............................XXX....X....X..X........X.",
                                 ".....................................XXXX....X......X..",
                                 "..............................................X....X...",
                                 "...............................................XXXX...."}));
}

// ---- Every figure against its rule
// ----------------------------------------------------------------

int64_t random_coordinate(Rng &rng, int32_t extent) {
  static constexpr int32_t kExtremes[] = {INT32_MIN, INT32_MIN + 1, -1,       0,
                                          1,         INT32_MAX - 1, INT32_MAX};
  const uint64_t kind = rng() % 3;
  if (kind == 0) return static_cast<int32_t>(static_cast<uint32_t>(rng()));
  if (kind == 1) return kExtremes[rng() % 7];
  return int64_t(rng() % uint64_t(extent + 80)) - 40;
}

// A random pixel of the outline, relative to the d x d box, so that huge circles can be placed
// across a small raster.
Pixel some_outline_pixel(int64_t d, Rng &rng) {
  int64_t edge, diagonal;
  circle_lengths(d, edge, diagonal);
  const int64_t t = diagonal + 1 + int64_t(rng() % uint64_t(edge));
  const int64_t j = 1 + int64_t(rng() % uint64_t(std::max<int64_t>(diagonal, 1)));
  const int64_t side = rng() % 2 ? 0 : d - 1, column = side == 0 ? j : d - 1 - j;
  const uint64_t kind = rng() % (diagonal > 0 ? 4 : 2);
  if (kind < 2) return kind == 0 ? Pixel{t, side} : Pixel{side, t};
  return {column, kind == 2 ? diagonal + 1 - j : diagonal + edge + j};
}

// Random lines of every length, half of them reflected through a pixel of the raster so that
// huge lines cross it; rectangles of sizes up to 2^32 - 1 with one corner near the raster;
// circles small and huge, the huge ones with a random pixel of their outline in the raster. The
// clipped, stepped drawing must put exactly the figure's own pixels inside.
TEST(Drawing, RandomFiguresPutExactlyTheirOwnPixelsInside) {
  Rng rng(7);
  const auto below = [&rng](int64_t n) { return int64_t(rng() % uint64_t(n)); };
  for (int n = 0; n < 6000; ++n) {
    const int32_t height = int32_t(1 + below(40)), width = int32_t(1 + below(40));
    const Figure figure = Figure(n % 3);
    int64_t p[4] = {random_coordinate(rng, width), random_coordinate(rng, height),
                    random_coordinate(rng, width), random_coordinate(rng, height)};
    if (figure == Figure::kLine && n % 2 == 0) {
      p[2] = 2 * below(width) - p[0];  // reflected through a pixel of the raster
      p[3] = 2 * below(height) - p[1];
    } else if (figure == Figure::kRectangle) {
      p[2] = below(n % 4 == 2 ? 20 : int64_t{1} << 32);
      p[3] = below(n % 5 == 1 ? 20 : int64_t{1} << 32);
      p[0] = below(width + 6) - 3 - (rng() % 2 ? p[2] : 0);
      p[1] = below(height + 6) - 3 - (rng() % 2 ? p[3] : 0);
    } else if (figure == Figure::kCircle) {
      const bool huge = n % 2 == 1;
      p[0] = huge ? 3 + below(0xfffffffc) : below(120);
      const Pixel on = huge ? some_outline_pixel(p[0], rng) : Pixel{below(80) - 20, below(80) - 20};
      p[1] = below(width) - on.first + (p[0] - 1) / 2;
      p[2] = below(height) - on.second + (p[0] - 1) / 2;
    }
    SCOPED_TRACE(testing::Message()
                 << int(figure) << ": " << p[0] << " " << p[1] << " " << p[2] << " " << p[3]);
    Canvas canvas(height, width);
    draw(canvas, figure, p);
    expect_figure(canvas, rule(figure, p));
  }
  // 2^32 - 1 columns rising 2 rows: the row turns from 3 to 4 exactly at column 0.
  Canvas wide(100, 100);
  kel_image_draw_line(wide.data(), 100, 100, INT32_MIN, 3, INT32_MAX, 5, kInk);
  expect_figure(wide, [](int64_t, int64_t y) { return y == 4; });
  const std::pair<Figure, std::vector<int64_t>> kHuge[] = {
      {Figure::kRectangle, {0, 0, 4000000000, 4000000000}},
      {Figure::kCircle, {4000000000, 0, 0, 0}},
      {Figure::kCircle, {4000000000, 2000000005, 240, 0}}};
  for (const auto &huge : kHuge) {
    Canvas large(480, 640);
    draw(large, huge.first, huge.second.data());
    expect_figure(large, rule(huge.first, huge.second.data()));
  }
}

// ---- Numbers ------------------------------------------------------------------------------------

TEST(DrawNumber, DrawsTheWorkedMinusFortyTwo) {
  Canvas canvas(10, 16);
  kel_image_draw_number(canvas.data(), 10, 16, -42, 1, 0, 1, kInk);
  EXPECT_EQ(canvas.text(),
            (Rows{"....ooooooooooo.", "....ooooXooXXoo.", "....oooXXoXooXo.", "....ooXoXooooXo.",
                  ".XX.oXooXoooXoo.", "....oXXXXooXooo.", "....ooooXoXoooo.", "....ooooXoXXXXo.",
                  "....ooooooooooo.", "................"}));
}

// The font as pictures, one 4 x 7 cell per digit.
const char *const kGlyphRows[7] = {
    ".XX...X..XX..XX....XXXXX.XX.XXXX.XX..XX.", "X..X.XX.X..XX..X..XXX...X..X...XX..XX..X",
    "X..X..X....X...X.X.XX...X.....X.X..XX..X", "X..X..X...X...X.X..X.XX.XXX..X...XX..XXX",
    "X..X..X..X..X..XXXXX...XX..X.X..X..X...X", "X..X..X.X...X..X...X...XX..X.X..X..XX..X",
    ".XX.XXXXXXXX.XX....XXXX..XX..X...XX..XX."};

// The picture of a number drawn at (1, 1): a 5-column step for a minus sign, then each digit's
// cell inside its box of 'o'.
Rows number_picture(const std::string &shown) {
  const bool negative = shown[0] == '-';
  Rows out;
  for (int row = -1; row <= 7; ++row) {
    std::string line = negative ? (row == 3 ? "..XX.o" : ".....o") : "o";
    for (const char digit : shown.substr(negative ? 1 : 0)) {
      std::string cell =
          row < 0 || row > 6 ? "...." : std::string(kGlyphRows[row] + 4 * (digit - '0'), 4);
      std::replace(cell.begin(), cell.end(), '.', 'o');  // the glyph's cell lies on its box
      line += cell + 'o';
    }
    out.push_back(line);
  }
  return out;
}

TEST(DrawNumber, DrawsDigitsInBoxesFromTheFont) {
  const struct {
    int32_t value;
    uint8_t min_digits;
    const char *shown;
  } kCases[] = {
      {123456789, 0, "123456789"},
      {0, 1, "0"},
      {42, 3, "042"},
      {7, 9, "000000007"},
      {0, 200, "000000000"},
      {-7, 0, "-7"},
      {999999999, 0, "999999999"},
      {100000000, 1, "100000000"},
      {-1, 4, "-0001"},
      // Beyond nine digits the display saturates to all nines.
      {INT32_MAX, 0, "999999999"},
      {1000000000, 0, "999999999"},
      {INT32_MIN, 0, "-999999999"},
  };
  for (const auto &c : kCases) {
    SCOPED_TRACE(c.value);
    const Rows expected = number_picture(c.shown);
    const int32_t width = int32_t(expected[0].size());
    Canvas canvas(9, width);
    kel_image_draw_number(canvas.data(), 9, width, c.value, c.min_digits, 1, 1, kInk);
    EXPECT_EQ(canvas.text(), expected);
  }
  Canvas zero(9, 9);  // 0 with min_digits 0 shows nothing at all
  kel_image_draw_number(zero.data(), 9, 9, 0, 0, 1, 1, kInk);
  EXPECT_EQ(zero.text(), Rows(9, "........."));
  for (const uint8_t colour : {uint8_t{0}, uint8_t{200}}) {
    Canvas canvas(9, 6);
    kel_image_draw_number(canvas.data(), 9, 6, 1, 1, 1, 1, colour);
    EXPECT_EQ(canvas.at(3, 1), colour);        // glyph 1 starts at column 2 of its cell
    EXPECT_EQ(canvas.at(0, 0), 255 - colour);  // box corner
  }
}

// A number crossing the raster's edges puts the same pixels inside as on a larger raster: the
// minus sign loses its pixel at column -1 and keeps the one at column 0; a box loses row and
// column -1 only.
TEST(DrawNumber, ClipsEachPixelOnItsOwn) {
  constexpr int32_t kMargin = 10;
  for (const auto &at : {std::pair{-2, -3}, {0, 0}, {3, 5}}) {
    Canvas small(10, 8), large(10 + 2 * kMargin, 8 + 2 * kMargin);
    kel_image_draw_number(small.data(), 10, 8, -305, 1, at.first, at.second, kInk);
    kel_image_draw_number(large.data(), large.height, large.width, -305, 1, at.first + kMargin,
                          at.second + kMargin, kInk);
    Rows inner;
    for (int32_t y = kMargin; y < kMargin + 10; ++y)
      inner.push_back(large.text()[y].substr(kMargin, 8));
    EXPECT_EQ(small.text(), inner) << at.first << "," << at.second;
  }
}

TEST(Drawing, EmptyRastersReceiveNothing) {
  for (const auto &size : {std::pair{0, 10}, {10, 0}, {-1, 10}, {10, -5}, {-3, -3}}) {
    kel_test::Guarded bytes(0, '.');
    uint8_t *b = bytes.data();
    const int32_t h = size.first, w = size.second;
    kel_image_draw_line(b, h, w, 0, 0, 5, 5, kInk);
    kel_image_draw_triangle(b, h, w, 0, 0, 5, 0, 0, 5, kInk);
    kel_image_draw_rectangle(b, h, w, 0, 0, 5, 5, kInk);
    kel_image_draw_circle(b, h, w, 1, 0, 0, kInk);
    kel_image_draw_number(b, h, w, 8, 1, 1, 1, kInk);
    EXPECT_TRUE(bytes.guards_intact()) << h << "x" << w;
  }
}

}  // namespace
