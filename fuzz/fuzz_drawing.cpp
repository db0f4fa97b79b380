// The drawing routines against plain models that visit every pixel of the figure (whenever the
// figure is short enough to walk), with any coordinates up to the int32 extremes: guards around
// the raster, and the same pixels inside a raster as in the top-left corner of a larger one.
#include <algorithm>
#include <cstdint>
#include <cstring>
#include <vector>

#include "fuzz_support.h"
#include "kel_images.h"

namespace {

using kel_fuzz::Guarded;
using kel_fuzz::Reader;

// Figures with more steps than this are checked by the guards and the corner property only.
constexpr int64_t kLongestModelled = int64_t{1} << 15;

// A raster as the models write it: the plain clipped write.
struct ModelRaster {
  std::vector<uint8_t> &pixels;
  int64_t height, width;
  void plot(int64_t x, int64_t y, uint8_t colour) const {
    if (x >= 0 && x < width && y >= 0 && y < height) pixels[size_t(y * width + x)] = colour;
  }
};

void model_line(const ModelRaster &r, int64_t x0, int64_t y0, int64_t x1, int64_t y1,
                uint8_t colour) {
  r.plot(x0, y0, colour);
  r.plot(x1, y1, colour);
  if (y0 > y1) {
    std::swap(x0, x1);
    std::swap(y0, y1);
  }
  const int64_t dx = x1 - x0, dy = y1 - y0;
  if (dx == 0 && dy == 0) return;
  const int64_t run = dx < 0 ? -dx : dx;
  if (dy > run) {
    for (int64_t i = 1; i < dy; ++i) r.plot(x0 + i * dx / dy, y0 + i, colour);  // toward zero
  } else {
    const int64_t direction = dx > 0 ? 1 : -1;
    for (int64_t i = 1; i < run; ++i) r.plot(x0 + direction * i, y0 + i * dy / run, colour);
  }
}

void model_rectangle(const ModelRaster &r, int64_t x, int64_t y, int64_t rw, int64_t rh,
                     uint8_t colour) {
  const int64_t xr = x + rw - 1, yb = y + rh - 1;
  for (int64_t col = x; rw != 0 && col <= xr; ++col) {
    r.plot(col, y, colour);
    r.plot(col, yb, colour);
  }
  for (int64_t row = y + 1; rh >= 3 && row <= yb - 1; ++row) {
    r.plot(x, row, colour);
    r.plot(xr, row, colour);
  }
}

void model_circle(const ModelRaster &r, int64_t d, int64_t x, int64_t y, uint8_t colour) {
  if (d == 0) return;
  if (d <= 2) {
    r.plot(x, y, colour);
    if (d == 2) {
      r.plot(x + 1, y, colour);
      r.plot(x, y + 1, colour);
      r.plot(x + 1, y + 1, colour);
    }
    return;
  }
  static constexpr int64_t kAdjustment[4] = {0, 0, 1, -1};
  const int64_t h = d / 2, L = h + kAdjustment[(d - 3) % 4], K = (d + 2 - L) / 2;
  const int64_t s = K > 2 ? K - 2 : 0, e_d = d % 2 == 0, e_l = L % 2 == 0;
  const int64_t left = x - h + e_d, right = left + d - 1, top = y - h + e_d, bottom = top + d - 1;
  const int64_t ex = x - L / 2 + e_l, ey = y - L / 2 + e_l;
  for (int64_t col = ex; col < ex + L; ++col) {
    r.plot(col, top, colour);
    r.plot(col, bottom, colour);
  }
  for (int64_t row = ey; row < ey + L; ++row) {
    r.plot(left, row, colour);
    r.plot(right, row, colour);
  }
  for (int64_t j = 1; j <= s; ++j) {
    r.plot(left + j, ey - j, colour);
    r.plot(right - j, ey - j, colour);
    r.plot(left + j, ey + L - 1 + j, colour);
    r.plot(right - j, ey + L - 1 + j, colour);
  }
}

constexpr int kGlyphSize[10] = {14, 11, 12, 12, 13, 13, 14, 10, 14, 14};
constexpr int kGlyph[10][14] = {
    {1, 2, 4, 7, 8, 11, 12, 15, 16, 19, 20, 23, 25, 26},
    {2, 5, 6, 10, 14, 18, 22, 24, 25, 26, 27},
    {1, 2, 4, 7, 11, 14, 17, 20, 24, 25, 26, 27},
    {1, 2, 4, 7, 11, 14, 16, 19, 20, 23, 25, 26},
    {3, 6, 7, 9, 11, 12, 15, 16, 17, 18, 19, 23, 27},
    {0, 1, 2, 3, 4, 8, 13, 14, 19, 23, 24, 25, 26},
    {1, 2, 4, 7, 8, 12, 13, 14, 16, 19, 20, 23, 25, 26},
    {0, 1, 2, 3, 7, 10, 13, 17, 21, 25},
    {1, 2, 4, 7, 8, 11, 13, 14, 16, 19, 20, 23, 25, 26},
    {1, 2, 4, 7, 8, 11, 13, 14, 15, 19, 20, 23, 25, 26},
};

void model_number(const ModelRaster &r, int64_t v, int min_digits, int64_t x, int64_t y,
                  uint8_t colour) {
  const uint8_t background = static_cast<uint8_t>(255 - colour);
  int64_t px = x;
  if (v < 0) {
    r.plot(px + 1, y + 3, colour);
    r.plot(px + 2, y + 3, colour);
    v = -v;
    px += 5;
  }
  bool started = false;
  int64_t place = 100000000;
  for (int i = 9; i >= 1; --i, place /= 10) {
    const int64_t d = v / place;
    if (d != 0) {
      started = true;
    } else if (!started && min_digits < i) {
      continue;
    }
    for (int64_t col = px - 1; col <= px + 4; ++col) {
      for (int64_t row = y - 1; row <= y + 7; ++row) r.plot(col, row, background);
    }
    for (int k = 0; k < kGlyphSize[d]; ++k)
      r.plot(px + kGlyph[d][k] % 4, y + kGlyph[d][k] / 4, colour);
    v -= d * place;
    px += 5;
  }
}

// One fuzzed call, replayable on any raster and on the model.
struct Figure {
  int kind;  // 0 line, 1 triangle, 2 rectangle, 3 number, 4 circle
  int32_t x[3], y[3];
  uint32_t a, b;  // rectangle sides, circle diameter, number value and min_digits
  uint8_t colour;

  void draw(uint8_t *buf, int32_t h, int32_t w) const {
    trace(h, w);
    switch (kind) {
      case 0:
        kel_image_draw_line(buf, h, w, x[0], y[0], x[1], y[1], colour);
        break;
      case 1:
        kel_image_draw_triangle(buf, h, w, x[0], y[0], x[1], y[1], x[2], y[2], colour);
        break;
      case 2:
        kel_image_draw_rectangle(buf, h, w, x[0], y[0], a, b, colour);
        break;
      case 3:
        kel_image_draw_number(buf, h, w, static_cast<int32_t>(a), static_cast<uint8_t>(b), x[0],
                              y[0], colour);
        break;
      default:
        kel_image_draw_circle(buf, h, w, a, x[0], y[0], colour);
        break;
    }
  }

  void trace(int32_t h, int32_t w) const {
    static const char *const kNames[] = {"line", "triangle", "rectangle", "number", "circle"};
    KEL_TRACE("draw_%s(h=%d w=%d x=%d,%d,%d y=%d,%d,%d a=%u b=%u colour=%u)\n", kNames[kind],
              int{h}, int{w}, int{x[0]}, int{x[1]}, int{x[2]}, int{y[0]}, int{y[1]}, int{y[2]},
              unsigned{a}, unsigned{b}, unsigned{colour});
  }

  static int64_t span(int32_t p, int32_t q) { return p > q ? int64_t{p} - q : int64_t{q} - p; }

  // Whether the plain model can walk the whole figure quickly.
  bool modelled() const {
    switch (kind) {
      case 0:
        return std::max(span(x[0], x[1]), span(y[0], y[1])) <= kLongestModelled;
      case 1:
        for (int i = 0; i < 3; ++i) {
          const int j = (i + 1) % 3;
          if (std::max(span(x[i], x[j]), span(y[i], y[j])) > kLongestModelled) return false;
        }
        return true;
      case 2:
        return a <= kLongestModelled && b <= kLongestModelled;
      case 4:
        return a <= kLongestModelled;
      default:
        return true;
    }
  }

  void model(const ModelRaster &r) const {
    switch (kind) {
      case 0:
        model_line(r, x[0], y[0], x[1], y[1], colour);
        break;
      case 1:
        model_line(r, x[0], y[0], x[1], y[1], colour);
        model_line(r, x[1], y[1], x[2], y[2], colour);
        model_line(r, x[2], y[2], x[0], y[0], colour);
        break;
      case 2:
        model_rectangle(r, x[0], y[0], a, b, colour);
        break;
      case 3: {
        // Beyond nine digits the library shows the nearest nine-digit value.
        const int64_t v = std::clamp<int64_t>(static_cast<int32_t>(a), -999999999, 999999999);
        model_number(r, v, static_cast<int>(b), x[0], y[0], colour);
        break;
      }
      default:
        model_circle(r, a, x[0], y[0], colour);
        break;
    }
  }
};

// A coordinate near another one (so that long figures can also be short), or anywhere.
int32_t near_or_anywhere(Reader &in, int32_t anchor, int32_t extent) {
  if (in.byte() < 100) {
    const int64_t v = int64_t{anchor} + in.in_range(-40, 40);
    return static_cast<int32_t>(std::clamp<int64_t>(v, INT32_MIN, INT32_MAX));
  }
  return in.coordinate(extent, 40);
}

Figure decode(Reader &in, int32_t h, int32_t w) {
  Figure f{};
  f.kind = in.byte() % 5;
  const int32_t extent = std::max(h, w);
  f.x[0] = in.coordinate(extent, 40);
  f.y[0] = in.coordinate(extent, 40);
  for (int i = 1; i < 3; ++i) {
    f.x[i] = near_or_anywhere(in, f.x[i - 1], extent);
    f.y[i] = near_or_anywhere(in, f.y[i - 1], extent);
  }
  switch (f.kind) {
    case 2:
    case 4:
      f.a = in.size(60);
      f.b = in.size(60);
      break;
    case 3: {
      const uint8_t selector = in.byte();
      f.a = selector < 128 ? static_cast<uint32_t>(in.in_range(-999, 9999))
                           : static_cast<uint32_t>(in.coordinate(0, 0));
      if (selector >= 250) f.a = static_cast<uint32_t>(in.i32() % 1000000000);
      f.b = in.byte() % 12;
      break;
    }
    default:
      break;
  }
  f.colour = in.byte();
  return f;
}

int32_t raster_side(Reader &in) {
  static constexpr int32_t kOdd[] = {INT32_MIN, -1, 0, INT32_MAX};
  const uint8_t selector = in.byte();
  if (selector < 230) return in.in_range(1, 40);
  return kOdd[selector % 4];
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size) {
  Reader in(data, size);
  int32_t h = raster_side(in), w = raster_side(in);
  // A raster must hold height * width bytes: an extreme side comes with an empty other one.
  if (h > 40 && w > 0) w = 0;
  if (w > 40 && h > 0) h = 0;
  const int32_t grow_h = in.in_range(0, 9), grow_w = in.in_range(0, 9);
  const size_t n = kel_fuzz::pixel_count(h, w);
  Guarded raster(n);
  in.pixels(raster.data(), n);
  const std::vector<uint8_t> before(raster.data(), raster.data() + n);
  const int figures = in.byte() % 3 + 1;
  std::vector<Figure> drawn;
  for (int i = 0; i < figures; ++i) {
    drawn.push_back(decode(in, h, w));
    drawn.back().draw(raster.data(), h, w);
    raster.check();
  }
  if (n == 0) return 0;

  // Only the figure's colours are ever written.
  for (size_t i = 0; i < n; ++i) {
    if (raster.data()[i] == before[i]) continue;
    bool known = false;
    for (const Figure &f : drawn) {
      known = known || raster.data()[i] == f.colour ||
              (f.kind == 3 && raster.data()[i] == static_cast<uint8_t>(255 - f.colour));
    }
    KEL_CHECK(known);
  }

  // The same figures on a raster larger to the right and below: the top-left corner must match.
  const int32_t big_h = h + grow_h, big_w = w + grow_w;
  Guarded big(size_t(big_h) * size_t(big_w));
  for (int32_t row = 0; row < big_h; ++row) {
    for (int32_t col = 0; col < big_w; ++col) {
      big.data()[size_t(row) * size_t(big_w) + size_t(col)] =
          row < h && col < w ? before[size_t(row) * size_t(w) + size_t(col)]
                             : static_cast<uint8_t>(row * 7 + col);
    }
  }
  for (const Figure &f : drawn) f.draw(big.data(), big_h, big_w);
  big.check();
  for (int32_t row = 0; row < h; ++row) {
    KEL_CHECK(kel_fuzz::same_bytes(big.data() + size_t(row) * size_t(big_w),
                                   raster.data() + size_t(row) * size_t(w), size_t(w)));
  }

  // And against the plain models when every figure is short enough to walk.
  if (!std::all_of(drawn.begin(), drawn.end(), [](const Figure &f) { return f.modelled(); })) {
    return 0;
  }
  std::vector<uint8_t> model = before;
  const ModelRaster model_raster{model, h, w};
  for (const Figure &f : drawn) f.model(model_raster);
  KEL_CHECK(kel_fuzz::same_bytes(model.data(), raster.data(), n));
  return 0;
}
