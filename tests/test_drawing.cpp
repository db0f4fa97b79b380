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

namespace {

using Pixel = std::pair<int64_t, int64_t>;  // (x, y)
using Pixels = std::set<Pixel>;
using OnFigure = std::function<bool(int64_t x, int64_t y)>;
using Rng = std::mt19937_64;

constexpr uint8_t kInk = 'X';
constexpr uint8_t kUntouched = '.';

// A raster of '.' with guard bytes on both sides, read back as text or as the set of inked pixels.
struct Canvas {
  static constexpr size_t kGuard = 64;
  int32_t height, width;
  std::vector<uint8_t> bytes;

  Canvas(int32_t h, int32_t w)
      : height(h), width(w), bytes(size_t(h) * size_t(w) + 2 * kGuard, kUntouched) {}
  uint8_t *data() { return bytes.data() + kGuard; }
  uint8_t at(int64_t x, int64_t y) const { return bytes[kGuard + size_t(y * width + x)]; }
  void check_guards() const {
    const auto intact = [](uint8_t b) { return b == kUntouched; };
    if (!std::all_of(bytes.begin(), bytes.begin() + kGuard, intact) ||
        !std::all_of(bytes.end() - kGuard, bytes.end(), intact)) {
      ADD_FAILURE() << "write outside the raster";
    }
  }
  // 'X' for the ink, 'o' for its complement (a digit's box), '.' for untouched.
  std::string text() const {
    check_guards();
    std::string out;
    for (int32_t y = 0; y < height; ++y) {
      for (int32_t x = 0; x < width; ++x) {
        const uint8_t v = at(x, y);
        out += v == kInk ? 'X' : v == 255 - kInk ? 'o' : v == kUntouched ? '.' : '?';
      }
      out += '\n';
    }
    return out;
  }
  Pixels inked() const {
    check_guards();
    Pixels out;
    for (int32_t y = 0; y < height; ++y) {
      for (int32_t x = 0; x < width; ++x) {
        if (at(x, y) == kInk) out.insert({x, y});
      }
    }
    return out;
  }
};

std::string lines(std::initializer_list<const char *> rows) {
  std::string out;
  for (const char *row : rows) out += std::string(row) + '\n';
  return out;
}

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
  const int64_t m = d / 4;
  edge = 2 * m + d % 2;
  diagonal = m - 1 + (d % 4 >= 2);
}

// In coordinates relative to the d x d box: edges start after the corner run of s + 1 steps.
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

// ---- Lines and triangles ------------------------------------------------------------------------

struct LineCase {
  int32_t x0, y0, x1, y1;
  Pixels pixels;
};

// On a 10 x 10 raster.
const LineCase kLineCases[] = {
    {0, 0, 3, 1, {{0, 0}, {3, 1}, {1, 0}, {2, 0}}},
    {3, 1, 0, 0, {{3, 1}, {0, 0}, {1, 0}, {2, 0}}},
    {3, 0, 0, 4, {{3, 0}, {0, 4}, {3, 1}, {2, 2}, {1, 3}}},
    {3, 0, 0, 3, {{3, 0}, {0, 3}, {2, 1}, {1, 2}}},
    {9, 0, 0, 2, {{9, 0}, {0, 2}, {8, 0}, {7, 0}, {6, 0}, {5, 0}, {4, 1}, {3, 1}, {2, 1}, {1, 1}}},
    {5, 0, 2, 9, {{5, 0}, {2, 9}, {5, 1}, {5, 2}, {4, 3}, {4, 4}, {4, 5}, {3, 6}, {3, 7}, {3, 8}}},
    {4, 4, 4, 4, {{4, 4}}},
    {4, 4, 5, 5, {{4, 4}, {5, 5}}},
    {4, 4, 5, 4, {{4, 4}, {5, 4}}},
    {7, 5, 2, 5, {{7, 5}, {2, 5}, {6, 5}, {5, 5}, {4, 5}, {3, 5}}},
    {1, 0, 1, 6, {{1, 0}, {1, 6}, {1, 1}, {1, 2}, {1, 3}, {1, 4}, {1, 5}}},
    {1, 0, 0, 5, {{1, 0}, {0, 5}, {1, 1}, {1, 2}, {1, 3}, {1, 4}}},
    {0, 0, 3, 3, {{0, 0}, {3, 3}, {1, 1}, {2, 2}}},
    // Clipped: neither end point is inside; the pixels inside are those of the whole line.
    {-5, -5, 20, 14, {{2, 0}, {3, 1}, {4, 1}, {5, 2}, {6, 3}, {7, 4}, {8, 4}, {9, 5}}},
    // Deltas and products beyond 32 bits are still the true line, here x + y = 5.
    {INT32_MAX,
     INT32_MIN + 6,
     INT32_MIN + 6,
     INT32_MAX,
     {{5, 0}, {4, 1}, {3, 2}, {2, 3}, {1, 4}, {0, 5}}},
};

TEST(DrawLine, WritesExactlyItsPixels) {
  for (const LineCase &c : kLineCases) {
    SCOPED_TRACE(testing::Message() << c.x0 << "," << c.y0 << " to " << c.x1 << "," << c.y1);
    Canvas canvas(10, 10);
    kel_image_draw_line(canvas.data(), 10, 10, c.x0, c.y0, c.x1, c.y1, kInk);
    EXPECT_EQ(canvas.inked(), c.pixels);
  }
  // 2^32 - 1 columns rising 2 rows: the row turns from 3 to 4 exactly at column 0.
  Canvas wide(100, 100);
  kel_image_draw_line(wide.data(), 100, 100, INT32_MIN, 3, INT32_MAX, 5, kInk);
  expect_figure(wide, [](int64_t, int64_t y) { return y == 4; });
}

int32_t random_coordinate(Rng &rng, int32_t extent) {
  static constexpr int32_t kExtremes[] = {INT32_MIN, INT32_MIN + 1, -1,       0,
                                          1,         INT32_MAX - 1, INT32_MAX};
  switch (rng() % 3) {
    case 0:
      return static_cast<int32_t>(static_cast<uint32_t>(rng()));
    case 1:
      return kExtremes[rng() % 7];
    default:
      return static_cast<int32_t>(int64_t(rng() % uint64_t(extent + 80)) - 40);
  }
}

int32_t clamp32(int64_t v) {
  return int32_t(std::clamp<int64_t>(v, INT32_MIN, INT32_MAX));
}

// Random lines of every length, many of them reflected through a point of the raster so that
// huge lines cross it; the clipped, stepped drawing must equal the per-step division.
TEST(DrawLine, MatchesThePerStepDivisionOnRandomLines) {
  Rng rng(7);
  for (int n = 0; n < 3000; ++n) {
    const int32_t height = int32_t(1 + rng() % 40), width = int32_t(1 + rng() % 40);
    const int32_t x0 = random_coordinate(rng, width), y0 = random_coordinate(rng, height);
    int32_t x1 = random_coordinate(rng, width), y1 = random_coordinate(rng, height);
    if (n % 2 == 0) {
      x1 = clamp32(2 * int64_t(rng() % uint64_t(width)) - x0);
      y1 = clamp32(2 * int64_t(rng() % uint64_t(height)) - y0);
    }
    SCOPED_TRACE(testing::Message() << x0 << "," << y0 << " to " << x1 << "," << y1);
    Canvas canvas(height, width);
    kel_image_draw_line(canvas.data(), height, width, x0, y0, x1, y1, kInk);
    expect_figure(canvas, on_line(x0, y0, x1, y1));
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

// ---- Rectangles ---------------------------------------------------------------------------------

struct RectangleCase {
  int32_t x, y;
  uint32_t rect_width, rect_height;
  Pixels pixels;
};

const RectangleCase kRectangleCases[] = {
    {2, 3, 1, 1, {{2, 3}}},
    {2, 3, 1, 2, {{2, 3}, {2, 4}}},
    {2, 3, 2, 1, {{2, 3}, {3, 3}}},
    {2, 3, 1, 5, {{2, 3}, {2, 4}, {2, 5}, {2, 6}, {2, 7}}},
    {2, 3, 4, 3, {{2, 3}, {3, 3}, {4, 3}, {5, 3}, {2, 5}, {3, 5}, {4, 5}, {5, 5}, {2, 4}, {5, 4}}},
    {2, 3, 4, 2, {{2, 3}, {3, 3}, {4, 3}, {5, 3}, {2, 4}, {3, 4}, {4, 4}, {5, 4}}},
    {-3, -3, 20, 20, {}},
    {9, 9, 5, 5, {{9, 9}}},
    {5, -2, 3, 5, {{5, 2}, {6, 2}, {7, 2}, {5, 0}, {7, 0}, {5, 1}, {7, 1}}},
    {2, 3, 0, 5, {{2, 4}, {1, 4}, {2, 5}, {1, 5}, {2, 6}, {1, 6}}},
    {2, 3, 0, 2, {}},
    {2, 3, 4, 0, {{2, 3}, {3, 3}, {4, 3}, {5, 3}, {2, 2}, {3, 2}, {4, 2}, {5, 2}}},
    // x + rect_width passes 2^31: the right column lands at x + rect_width - 1 = 1.
    {INT32_MIN, 7, 2147483650u, 3, {{0, 7}, {1, 7}, {1, 8}, {0, 9}, {1, 9}}},
};

TEST(DrawRectangle, WritesExactlyItsPixels) {
  for (const RectangleCase &c : kRectangleCases) {
    SCOPED_TRACE(testing::Message()
                 << c.x << "," << c.y << " " << c.rect_width << "x" << c.rect_height);
    Canvas canvas(10, 10);
    kel_image_draw_rectangle(canvas.data(), 10, 10, c.x, c.y, c.rect_width, c.rect_height, kInk);
    EXPECT_EQ(canvas.inked(), c.pixels);
  }
  Canvas border(4, 5);
  kel_image_draw_rectangle(border.data(), 4, 5, 0, 0, 5, 4, kInk);
  EXPECT_EQ(border.text(), lines({"XXXXX", "X...X", "X...X", "XXXXX"}));
}

// Sizes up to 2^32 - 1 with one corner placed in the raster.
TEST(DrawRectangle, HugeRectanglesAreTheTrueOutline) {
  Rng rng(11);
  for (int n = 0; n < 400; ++n) {
    const uint32_t rect_width = uint32_t(n % 3 == 0 ? rng() % 20 : rng());
    const uint32_t rect_height = uint32_t(n % 5 == 0 ? rng() % 20 : rng());
    const int64_t x = int64_t(rng() % 30) - (rng() % 2 ? int64_t{rect_width} : 0);
    const int64_t y = int64_t(rng() % 30) - (rng() % 2 ? int64_t{rect_height} : 0);
    Canvas canvas(24, 24);
    kel_image_draw_rectangle(canvas.data(), 24, 24, clamp32(x), clamp32(y), rect_width, rect_height,
                             kInk);
    expect_figure(canvas, on_rectangle(clamp32(x), clamp32(y), rect_width, rect_height));
  }
  Canvas large(480, 640);
  kel_image_draw_rectangle(large.data(), 480, 640, 0, 0, 4000000000u, 4000000000u, kInk);
  expect_figure(large, on_rectangle(0, 0, 4000000000u, 4000000000u));
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
  EXPECT_EQ(canvas.text(), lines({"X.XX..X...XX...XXX....XX.....XXX.....XXXX......XXXX....",
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

TEST(DrawCircle, EdgeCases) {
  Canvas nothing(10, 10);
  kel_image_draw_circle(nothing.data(), 10, 10, 0, 4, 4, kInk);
  EXPECT_TRUE(nothing.inked().empty());
  Canvas corner(10, 10);
  kel_image_draw_circle(corner.data(), 10, 10, 5, 0, 0, kInk);
  EXPECT_EQ(corner.inked(), (Pixels{{0, 2}, {1, 2}, {2, 0}, {2, 1}}));
  Canvas sixteen(20, 20);
  kel_image_draw_circle(sixteen.data(), 20, 20, 16, 9, 9, kInk);
  EXPECT_EQ(sixteen.inked().size(), 44u);
}

// A random outline pixel relative to the d x d box, so that huge circles can be placed across a
// small raster.
Pixel some_outline_pixel(int64_t d, Rng &rng) {
  int64_t edge, diagonal;
  circle_lengths(d, edge, diagonal);
  const int64_t t = int64_t(rng() % uint64_t(edge)), j = 1 + int64_t(rng() % uint64_t(diagonal));
  switch (rng() % (diagonal > 0 ? 6 : 2)) {
    case 0:
      return {diagonal + 1 + t, rng() % 2 ? 0 : d - 1};
    case 1:
      return {rng() % 2 ? 0 : d - 1, diagonal + 1 + t};
    case 2:
      return {j, diagonal + 1 - j};
    case 3:
      return {d - 1 - j, diagonal + 1 - j};
    case 4:
      return {j, diagonal + edge + j};
    default:
      return {d - 1 - j, diagonal + edge + j};
  }
}

TEST(DrawCircle, RandomAndHugeCirclesAreTheTrueOutline) {
  Rng rng(5);
  for (int n = 0; n < 1500; ++n) {
    const bool huge = n % 2 == 1;
    const uint32_t d = uint32_t(huge ? 3 + rng() % 0xfffffffcu : rng() % 120);
    int64_t x = int64_t(rng() % 100) - 40, y = int64_t(rng() % 100) - 40;
    if (huge) {
      const Pixel on = some_outline_pixel(d, rng);
      const int64_t reach = (int64_t{d} - 1) / 2;
      x = int64_t(rng() % 24) - on.first + reach;
      y = int64_t(rng() % 24) - on.second + reach;
    }
    SCOPED_TRACE(testing::Message() << d << " at " << x << "," << y);
    Canvas canvas(24, 24);
    kel_image_draw_circle(canvas.data(), 24, 24, d, clamp32(x), clamp32(y), kInk);
    expect_figure(canvas, on_circle(d, clamp32(x), clamp32(y)));
  }
  Canvas large(480, 640);
  kel_image_draw_circle(large.data(), 480, 640, 4000000000u, 0, 0, kInk);
  kel_image_draw_circle(large.data(), 480, 640, 4000000000u, 2000000005, 240, kInk);
  const OnFigure first = on_circle(4000000000u, 0, 0);
  const OnFigure second = on_circle(4000000000u, 2000000005, 240);
  expect_figure(large, [&](int64_t x, int64_t y) { return first(x, y) || second(x, y); });
}

// ---- Numbers ------------------------------------------------------------------------------------

TEST(DrawNumber, DrawsTheWorkedMinusFortyTwo) {
  Canvas canvas(10, 16);
  kel_image_draw_number(canvas.data(), 10, 16, -42, 1, 0, 1, kInk);
  EXPECT_EQ(canvas.text(),
            lines({"....ooooooooooo.", "....ooooXooXXoo.", "....oooXXoXooXo.", "....ooXoXooooXo.",
                   ".XX.oXooXoooXoo.", "....oXXXXooXooo.", "....ooooXoXoooo.", "....ooooXoXXXXo.",
                   "....ooooooooooo.", "................"}));
}

// The font as pictures, one 4 x 7 cell per digit.
const char *const kGlyphRows[7] = {
    ".XX...X..XX..XX....XXXXX.XX.XXXX.XX..XX.", "X..X.XX.X..XX..X..XXX...X..X...XX..XX..X",
    "X..X..X....X...X.X.XX...X.....X.X..XX..X", "X..X..X...X...X.X..X.XX.XXX..X...XX..XXX",
    "X..X..X..X..X..XXXXX...XX..X.X..X..X...X", "X..X..X.X...X..X...X...XX..X.X..X..XX..X",
    ".XX.XXXXXXXX.XX....XXXX..XX..X...XX..XX."};

// The expected picture of a number drawn at (1, 1): a 5-column step for a minus sign, then each
// digit's cell inside its box of 'o'.
std::string number_picture(const std::string &shown) {
  const bool negative = shown[0] == '-';
  const std::string digits = shown.substr(negative ? 1 : 0);
  std::string out;
  for (int row = -1; row <= 7; ++row) {
    out += negative ? (row == 3 ? "..XX." : ".....") : "";
    out += 'o';
    for (const char digit : digits) {
      std::string cell =
          row < 0 || row > 6 ? "...." : std::string(kGlyphRows[row] + 4 * (digit - '0'), 4);
      std::replace(cell.begin(), cell.end(), '.', 'o');  // the glyph's cell lies on its box
      out += cell + 'o';
    }
    out += '\n';
  }
  return out;
}

struct NumberCase {
  int32_t value;
  uint8_t min_digits;
  const char *shown;
};

const NumberCase kNumberCases[] = {
    {123456789, 0, "123456789"},
    {0, 1, "0"},
    {42, 3, "042"},
    {7, 9, "000000007"},
    {0, 200, "000000000"},
    {-7, 0, "-7"},
    {-42, 1, "-42"},
    {999999999, 0, "999999999"},
    {100000000, 1, "100000000"},
    {-1, 4, "-0001"},
    // Beyond nine digits the display saturates to all nines.
    {INT32_MAX, 0, "999999999"},
    {1000000000, 0, "999999999"},
    {INT32_MIN, 0, "-999999999"},
};

TEST(DrawNumber, DrawsDigitsInBoxesFromTheFont) {
  for (const NumberCase &c : kNumberCases) {
    SCOPED_TRACE(c.value);
    const int32_t width = int32_t(number_picture(c.shown).find('\n'));
    Canvas canvas(9, width);
    kel_image_draw_number(canvas.data(), 9, width, c.value, c.min_digits, 1, 1, kInk);
    EXPECT_EQ(canvas.text(), number_picture(c.shown));
  }
  Canvas zero(9, 9);
  kel_image_draw_number(zero.data(), 9, 9, 0, 0, 1, 1, kInk);
  EXPECT_TRUE(zero.inked().empty());
  EXPECT_EQ(zero.text().find_first_not_of(".\n"), std::string::npos);
}

TEST(DrawNumber, BackgroundIsTheComplementAndClipsPerPixel) {
  for (const uint8_t colour : {uint8_t{0}, uint8_t{200}}) {
    Canvas canvas(9, 6);
    kel_image_draw_number(canvas.data(), 9, 6, 1, 1, 1, 1, colour);
    EXPECT_EQ(canvas.at(3, 1), colour);        // glyph 1 starts at column 2 of its cell
    EXPECT_EQ(canvas.at(0, 0), 255 - colour);  // box corner
  }
  // x = -2: the minus pixel at column -1 is skipped, the one at column 0 is written.
  Canvas minus(10, 10);
  kel_image_draw_number(minus.data(), 10, 10, -7, 1, -2, 0, kInk);
  EXPECT_EQ(minus.at(0, 3), kInk);
}

// ---- Every figure -------------------------------------------------------------------------------

// Figures that cross the edges of a 10 x 8 raster, moved by (dx, dy).
void draw_figure(int figure, uint8_t *b, int32_t h, int32_t w, int32_t dx, int32_t dy) {
  switch (figure) {
    case 0:
      return kel_image_draw_line(b, h, w, -13 + dx, 4 + dy, 17 + dx, -6 + dy, kInk);
    case 1:
      return kel_image_draw_triangle(b, h, w, -3 + dx, -9 + dy, 12 + dx, 3 + dy, 2 + dx, 14 + dy,
                                     kInk);
    case 2:
      return kel_image_draw_rectangle(b, h, w, -2 + dx, 3 + dy, 9, 11, kInk);
    case 3:
      return kel_image_draw_circle(b, h, w, 13, 1 + dx, 8 + dy, kInk);
    case 4:
      return kel_image_draw_number(b, h, w, -305, 1, -4 + dx, dy, kInk);
    default:
      return kel_image_draw_number(b, h, w, 8, 1, dx, dy, kInk);  // box loses row/column -1
  }
}

// A figure crossing the raster's edges puts the same pixels inside as on a larger raster.
TEST(Drawing, ClippingKeepsTheWholeFiguresPixels) {
  constexpr int32_t kMargin = 20;
  for (int figure = 0; figure < 6; ++figure) {
    Canvas small(10, 8), large(10 + 2 * kMargin, 8 + 2 * kMargin);
    draw_figure(figure, small.data(), small.height, small.width, 0, 0);
    draw_figure(figure, large.data(), large.height, large.width, kMargin, kMargin);
    for (int32_t y = 0; y < small.height; ++y) {
      for (int32_t x = 0; x < small.width; ++x) {
        EXPECT_EQ(small.at(x, y), large.at(x + kMargin, y + kMargin))
            << figure << ": " << x << "," << y;
      }
    }
    small.check_guards();
  }
}

TEST(Drawing, EmptyRastersReceiveNothing) {
  for (const auto &size : {std::pair{0, 10}, {10, 0}, {-1, 10}, {10, -5}, {-3, -3}}) {
    std::vector<uint8_t> bytes(64, kUntouched);
    uint8_t *b = bytes.data() + 32;
    const int32_t h = size.first, w = size.second;
    kel_image_draw_line(b, h, w, 0, 0, 5, 5, kInk);
    kel_image_draw_triangle(b, h, w, 0, 0, 5, 0, 0, 5, kInk);
    kel_image_draw_rectangle(b, h, w, 0, 0, 5, 5, kInk);
    kel_image_draw_circle(b, h, w, 1, 0, 0, kInk);
    kel_image_draw_number(b, h, w, 8, 1, 1, 1, kInk);
    EXPECT_EQ(bytes, std::vector<uint8_t>(64, kUntouched)) << h << "x" << w;
  }
}

}  // namespace
