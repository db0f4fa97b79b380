// The truth table's runner: computes every row of truth.txt (embedded at build time, so that a
// board without a file system runs the same table) and compares its output text, or that text's
// digest, with the row's expectation. Depends on the library and the C library only; where
// Highway picks vector variants at run time the table runs once per variant this CPU has.
//   truth                 run the table; prints each failing row and "N passed, M failed"
//   truth --write FILE    recompute every digest (pictures stay as written) into FILE
//   truth --threads N     run the table on N threads at once (host builds)
#include <stdint.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>

#include "kel_images.h"
#include "kel_outside.h"
#if KEL_USE_HIGHWAY && !defined(HWY_COMPILE_ONLY_STATIC)
#include <hwy/targets.h>
#endif
#if KEL_TRUTH_THREADS
#include <thread>
#endif
#ifndef KEL_USE_HIGHWAY
#define KEL_USE_HIGHWAY 0
#endif

namespace {

const char kTable[] = {
#include "truth_table.inc"
    0};

// ---------------------------------------------------------------------------------------------
// The text every row renders; a digest row compares its FNV-1a hash, a picture row the text.
struct Text {
  char *chars = nullptr;
  size_t size = 0, capacity = 0;
  ~Text() { free(chars); }
  void put(const char *s, size_t n) {
    if (size + n + 1 > capacity) {
      capacity = 2 * (size + n + 1) + 256;
      chars = static_cast<char *>(realloc(chars, capacity));
      if (chars == nullptr) abort();
    }
    memcpy(chars + size, s, n);
    size += n;
    chars[size] = 0;
  }
  void put(const char *s) { put(s, strlen(s)); }
  void num(int64_t v) {
    char digits[24];
    int i = 24;
    uint64_t u = v < 0 ? 0 - static_cast<uint64_t>(v) : static_cast<uint64_t>(v);
    do digits[--i] = static_cast<char>('0' + u % 10);
    while ((u /= 10) != 0);
    if (v < 0) digits[--i] = '-';
    put(digits + i, static_cast<size_t>(24 - i));
  }
  void nums(const char *label, const int64_t *v, int n) {
    put(label);
    for (int i = 0; i < n; ++i) put(" "), num(v[i]);
    put("\n");
  }
  uint64_t digest() const {
    uint64_t h = 14695981039346656037u;
    for (size_t i = 0; i < size; ++i) h = (h ^ static_cast<uint8_t>(chars[i])) * 1099511628211u;
    return h;
  }
};

// ---------------------------------------------------------------------------------------------
// Generated inputs. A spec is a letter and a number: r<seed> random bytes, k<seed> random 0..3
// (keys and masks that hit), e<seed> random extremes, c<v> all v, g the grid 10 * row + column,
// b<seed> a mask of 1 with one to three rectangular holes of 0.
struct Spec {
  char kind;
  uint32_t n;
};

uint32_t next(uint32_t &s) {
  s ^= s << 13, s ^= s >> 17, s ^= s << 5;
  return s;
}

void generate(Spec spec, uint8_t *p, int64_t h, int64_t w) {
  static const uint8_t kExtremes[] = {0, 1, 2, 126, 127, 128, 129, 253, 254, 255};
  uint32_t s = spec.n * 2654435761u + 1;
  const size_t n = h > 0 && w > 0 ? static_cast<size_t>(h * w) : 0;
  for (size_t i = 0; i < n; ++i) {
    const uint32_t r = next(s) >> 8;
    switch (spec.kind) {
      case 'r':
        p[i] = static_cast<uint8_t>(r);
        break;
      case 'k':
        p[i] = static_cast<uint8_t>(r & 3);
        break;
      case 'e':
        p[i] = kExtremes[r % 10];
        break;
      case 'g':
        p[i] = static_cast<uint8_t>(10 * (i / static_cast<size_t>(w)) + i % static_cast<size_t>(w));
        break;
      case 'b':
        p[i] = 1;
        break;
      default:
        p[i] = static_cast<uint8_t>(spec.n);
    }
  }
  for (int holes = spec.kind == 'b' ? 1 + static_cast<int>(next(s) % 3) : 0; holes > 0 && n;
       --holes) {
    const int64_t y0 = next(s) % h, x0 = next(s) % w;
    const int64_t y1 = y0 + 1 + next(s) % h, x1 = x0 + 1 + next(s) % w;
    for (int64_t y = y0; y < y1 && y < h; ++y) {
      for (int64_t x = x0; x < x1 && x < w; ++x) p[y * w + x] = 0;
    }
  }
}

// A raster with guard bytes on both sides; rendering it reports a touched guard.
struct Raster {
  static constexpr size_t kGuard = 32;
  uint8_t *block;
  int64_t h, w;
  size_t n;
  Raster(Spec spec, int64_t height, int64_t width) : h(height), w(width) {
    n = h > 0 && w > 0 ? static_cast<size_t>(h * w) : 0;
    block = static_cast<uint8_t *>(malloc(n + 2 * kGuard));
    if (block == nullptr) abort();
    memset(block, 0xA5, n + 2 * kGuard);
    generate(spec, data(), h, w);
  }
  ~Raster() { free(block); }
  uint8_t *data() const { return block + kGuard; }
  bool guards_intact() const {
    for (size_t i = 0; i < kGuard; ++i) {
      if (block[i] != 0xA5 || block[kGuard + n + i] != 0xA5) return false;
    }
    return true;
  }
};

// Rows of numbers; drawings instead show colour as X, its complement as o and the background
// (when constant) as '.', any other value as a number in brackets.
void render(Text &t, const uint8_t *p, int64_t h, int64_t w, bool is_signed = false) {
  for (int64_t y = 0; y < h; ++y) {
    for (int64_t x = 0; x < w; ++x) {
      if (x) t.put(" ");
      const uint8_t v = p[y * w + x];
      t.num(is_signed ? static_cast<int8_t>(v) : v);
    }
    t.put("\n");
  }
}
void render(Text &t, const Raster &r) {
  render(t, r.data(), r.h, r.w);
  if (!r.guards_intact()) t.put("guard bytes written\n");
}
void render_drawing(Text &t, const Raster &r, Spec bg, uint8_t colour) {
  for (int64_t y = 0; y < r.h; ++y) {
    for (int64_t x = 0; x < r.w; ++x) {
      const uint8_t v = r.data()[y * r.w + x];
      if (v == colour)
        t.put("X");
      else if (v == 255 - colour)
        t.put("o");
      else if (bg.kind == 'c' && v == bg.n)
        t.put(".");
      else
        t.put("("), t.num(v), t.put(")");
    }
    t.put("\n");
  }
  if (!r.guards_intact()) t.put("guard bytes written\n");
}

// ---------------------------------------------------------------------------------------------
// The routines. Each takes its row's arguments: numbers in a[], input specs in s[], in the order
// the row gives them (a spec is not counted among the numbers).
using Args = const int64_t *;
using Specs = const Spec *;
template <typename T>
T as(int64_t v) {
  return static_cast<T>(v);
}

// image h w pixel_bytes stride|-1: the record (made by kel_image_create when stride is -1), its
// last pixel's offset and address, and the area after kel_image_clear.
void image(Text &t, Args a, Specs) {
  kel_image *im = a[3] < 0
                      ? kel_image_create(as<int32_t>(a[0]), as<int32_t>(a[1]), as<int32_t>(a[2]))
                      : kel_image_create_ex(as<int32_t>(a[0]), as<int32_t>(a[1]), as<int32_t>(a[2]),
                                            as<int32_t>(a[3]));
  if (im == nullptr) return t.put("null\n");
  const int64_t fields[] = {im->height, im->width, im->stride, im->pixel_bytes,
                            im->data == reinterpret_cast<uint8_t *>(im + 1)};
  t.nums("record", fields, 5);
  const size_t bytes = static_cast<size_t>(im->height) * static_cast<size_t>(im->stride);
  memset(im->data, 0xA5, bytes);
  kel_image_clear(im);
  int64_t left = 0;
  for (size_t i = 0; i < bytes; ++i) left += im->data[i];
  const int32_t off = kel_image_offset(im, im->height - 1, im->width - 1);
  const int64_t last[] = {off, kel_image_ptr(im, im->height - 1, im->width - 1) - im->data, left};
  t.nums("last clear", last, 3);
  kel_image_delete(im);
  kel_image_delete(nullptr);
}

// offset stride pixel_bytes row col: addressing in wrapping 32-bit arithmetic, on a record that
// owns no pixels (nothing is dereferenced).
void offset(Text &t, Args a, Specs) {
  uint8_t base[1];
  const kel_image im = {base, 1, 1, as<int32_t>(a[0]), as<int32_t>(a[1])};
  const int32_t off = kel_image_offset(&im, as<int32_t>(a[2]), as<int32_t>(a[3]));
  const uintptr_t p =
      reinterpret_cast<uintptr_t>(kel_image_ptr(&im, as<int32_t>(a[2]), as<int32_t>(a[3])));
  const int64_t v[] = {off, as<int32_t>(as<uint32_t>(p - reinterpret_cast<uintptr_t>(base)))};
  t.nums("offset ptr", v, 2);
}

// rows height row_step: the row table's entries as distances from the buffer, and one entry
// beyond it that must stay untouched.
void rows(Text &t, Args a, Specs) {
  static uint8_t buf[1];
  uint8_t *table[66];
  for (uint8_t *&p : table) p = nullptr;
  kel_images_1D_to_2D(buf, as<uint32_t>(a[0]), as<int32_t>(a[1]), table);
  int64_t v[66];
  for (int i = 0; i < 66; ++i)
    v[i] = table[i] ? as<int32_t>(as<uint32_t>(reinterpret_cast<uintptr_t>(table[i]) -
                                               reinterpret_cast<uintptr_t>(buf)))
                    : -1;
  t.nums("rows", v, a[0] + 1 < 66 ? static_cast<int>(a[0]) + 1 : 66);
}

// pixel <raster> h w y x colour
void pixel(Text &t, Args a, Specs s) {
  Raster r(s[0], a[0], a[1]);
  kel_set_pixel(r.data(), as<uint32_t>(a[0]), as<uint32_t>(a[1]), as<uint32_t>(a[2]),
                as<uint16_t>(a[3]), as<uint8_t>(a[4]));
  render(t, r);
}

// stats <raster> h w bits: both histograms, the image statistics (the mean stored and not) and
// the histogram statistics over the image's own pixel count.
void stats(Text &t, Args a, Specs s) {
  Raster r(s[0], a[0], a[1]);
  const int32_t h = as<int32_t>(a[0]), w = as<int32_t>(a[1]);
  uint32_t hist[256], reduced[256];
  int64_t v[256];
  kel_image_histogram(r.data(), h, w, hist);
  for (uint32_t &bin : reduced) bin = 0xDEADBEEF;
  kel_image_histogram_n(r.data(), h, w, as<uint32_t>(a[2]), reduced);
  for (int i = 0; i < 256; ++i) v[i] = hist[i];
  t.nums("hist", v, 256);
  for (int i = 0; i < 256; ++i) v[i] = reduced[i];
  t.nums("reduced", v, 256);
  uint8_t mean_var = 1, mean_std = 2;
  const uint16_t var = kel_image_var(r.data(), h, w, &mean_var);
  const uint8_t std_dev = kel_image_std(r.data(), h, w, &mean_std);
  const uint32_t count = as<uint32_t>(h) * as<uint32_t>(w);
  const uint8_t mean = kel_hist_mean(hist, count);
  const int64_t out[] = {var,
                         mean_var,
                         std_dev,
                         mean_std,
                         kel_image_var(r.data(), h, w, nullptr),
                         kel_image_std(r.data(), h, w, nullptr),
                         mean,
                         kel_hist_var(hist, mean, count),
                         kel_hist_std(hist, mean, count)};
  t.nums("var mean std mean var std hmean hvar hstd", out, 9);
  if (!r.guards_intact()) t.put("guard bytes written\n");
}

// hstat seed scale count|-1 mean|-1: statistics of a histogram of random bins below scale (any
// 32-bit value for 0), over count pixels (their sum for -1), about mean (the computed one for -1).
void hstat(Text &t, Args a, Specs) {
  uint32_t hist[256], sum = 0, seed = as<uint32_t>(a[0]) * 2654435761u + 7;
  for (uint32_t &bin : hist) sum += bin = a[1] ? next(seed) % as<uint32_t>(a[1]) : next(seed);
  const uint32_t count = a[2] < 0 ? sum : as<uint32_t>(a[2]);
  const uint8_t mean = a[3] < 0 ? kel_hist_mean(hist, count) : as<uint8_t>(a[3]);
  const int64_t v[] = {kel_hist_mean(hist, count), kel_hist_var(hist, mean, count),
                       kel_hist_std(hist, mean, count)};
  t.nums("mean var std", v, 3);
}

// rotate <raster> h w angle: the three rotations of the same bytes (read as signed for the
// int8 ones), each canvas with its size and the source corner's position.
void rotate(Text &t, Args a, Specs s) {
  Raster r(s[0], a[0], a[1]);
  const auto *signed_src = reinterpret_cast<const int8_t *>(r.data());
  const uint8_t angle = as<uint8_t>(a[2]);
  for (int kind = 0; kind < 3; ++kind) {
    uint8_t *canvas = nullptr;
    int32_t g[4] = {-9, -9, -9, -9};
    auto **signed_canvas = reinterpret_cast<int8_t **>(&canvas);
    if (kind == 0)
      kel_image_rotate(r.data(), as<uint32_t>(a[0]), as<uint32_t>(a[1]), angle, &canvas, &g[0],
                       &g[1], &g[2], &g[3]);
    if (kind == 1)
      kel_image_rotate_int8(signed_src, as<uint32_t>(a[0]), as<uint32_t>(a[1]), angle,
                            signed_canvas, &g[0], &g[1], &g[2], &g[3]);
    if (kind == 2)
      kel_image_rotate_int8_nn(signed_src, as<int32_t>(a[0]), as<int32_t>(a[1]), angle,
                               signed_canvas, &g[0], &g[1], &g[2], &g[3]);
    const int64_t geometry[] = {g[0], g[1], g[2], g[3], canvas != nullptr};
    t.nums(kind == 0   ? "u8 canvas h w offset y x"
           : kind == 1 ? "s8 canvas h w offset y x"
                       : "nn canvas h w offset y x",
           geometry, 5);
    if (canvas) render(t, canvas, g[0], g[1], kind > 0);
    free(canvas);
  }
  if (!r.guards_intact()) t.put("guard bytes written\n");
}

// point <raster> h w percent key: brighten, darken and the key's mask, each into a second raster
// and in place (the two must agree).
void point(Text &t, Args a, Specs s) {
  const uint32_t h = as<uint32_t>(a[0]), w = as<uint32_t>(a[1]);
  for (int op = 0; op < 3; ++op) {
    Raster src(s[0], a[0], a[1]), out(Spec{'c', 77}, a[0], a[1]);
    for (int in_place = 0; in_place < 2; ++in_place) {
      uint8_t *dst = in_place ? src.data() : out.data();
      if (op == 0) kel_image_brighten(src.data(), h, w, as<uint32_t>(a[2]), dst);
      if (op == 1) kel_image_darken(src.data(), h, w, as<uint32_t>(a[2]), dst);
      if (op == 2) kel_get_mask(src.data(), h, w, as<int32_t>(a[3]), dst);
    }
    t.put(op == 0 ? "brighten\n" : op == 1 ? "darken\n" : "mask\n");
    render(t, out);
    if (memcmp(src.data(), out.data(), out.n) != 0 || !src.guards_intact())
      t.put("in place differs\n");
  }
}

// compose <dst> dh dw <src> sh sw x y key [overlap]: paste, then blend, of src onto dst; with
// overlap the source is dst's own memory from that byte on.
void compose(Text &t, Args a, Specs s, int n) {
  for (int blend = 0; blend < 2; ++blend) {
    Raster dst(s[0], a[0], a[1]), src(s[1], a[2], a[3]);
    const uint8_t *from = n > 7 ? dst.data() + a[7] : src.data();
    auto call = blend ? kel_image_blend_image : kel_image_draw_image;
    call(dst.data(), as<int32_t>(a[0]), as<int32_t>(a[1]), from, as<uint16_t>(a[2]),
         as<uint16_t>(a[3]), as<int32_t>(a[4]), as<int32_t>(a[5]), as<uint16_t>(a[6]));
    t.put(blend ? "blend\n" : "paste\n");
    render(t, dst);
  }
}

// fill <raster> h w <mask> [in place]: the masked fill.
void fill(Text &t, Args a, Specs s, int n) {
  Raster src(s[0], a[0], a[1]), mask(s[1], a[0], a[1]), dst(Spec{'c', 77}, a[0], a[1]);
  uint8_t *out = n > 2 ? src.data() : dst.data();
  kel_mask_image(src.data(), as<uint16_t>(a[0]), as<uint16_t>(a[1]), mask.data(), out);
  render(t, n > 2 ? src : dst);
}

// Drawings: <background> h w then the routine's own arguments, colour last.
void line(Text &t, Args a, Specs s) {
  Raster r(s[0], a[0], a[1]);
  kel_image_draw_line(r.data(), as<int32_t>(a[0]), as<int32_t>(a[1]), as<int32_t>(a[2]),
                      as<int32_t>(a[3]), as<int32_t>(a[4]), as<int32_t>(a[5]), as<uint8_t>(a[6]));
  render_drawing(t, r, s[0], as<uint8_t>(a[6]));
}
void triangle(Text &t, Args a, Specs s) {
  Raster r(s[0], a[0], a[1]);
  kel_image_draw_triangle(r.data(), as<int32_t>(a[0]), as<int32_t>(a[1]), as<int32_t>(a[2]),
                          as<int32_t>(a[3]), as<int32_t>(a[4]), as<int32_t>(a[5]),
                          as<int32_t>(a[6]), as<int32_t>(a[7]), as<uint8_t>(a[8]));
  render_drawing(t, r, s[0], as<uint8_t>(a[8]));
}
void rect(Text &t, Args a, Specs s) {
  Raster r(s[0], a[0], a[1]);
  kel_image_draw_rectangle(r.data(), as<int32_t>(a[0]), as<int32_t>(a[1]), as<int32_t>(a[2]),
                           as<int32_t>(a[3]), as<uint32_t>(a[4]), as<uint32_t>(a[5]),
                           as<uint8_t>(a[6]));
  render_drawing(t, r, s[0], as<uint8_t>(a[6]));
}
void number(Text &t, Args a, Specs s) {
  Raster r(s[0], a[0], a[1]);
  kel_image_draw_number(r.data(), as<int32_t>(a[0]), as<int32_t>(a[1]), as<int32_t>(a[2]),
                        as<uint8_t>(a[3]), as<int32_t>(a[4]), as<int32_t>(a[5]), as<uint8_t>(a[6]));
  render_drawing(t, r, s[0], as<uint8_t>(a[6]));
}
void circle(Text &t, Args a, Specs s) {
  Raster r(s[0], a[0], a[1]);
  kel_image_draw_circle(r.data(), as<int32_t>(a[0]), as<int32_t>(a[1]), as<uint32_t>(a[2]),
                        as<int32_t>(a[3]), as<int32_t>(a[4]), as<uint8_t>(a[5]));
  render_drawing(t, r, s[0], as<uint8_t>(a[5]));
}

// The outside functions. trig first count: cosine and sine of consecutive angles; sqrt x step
// count: roots of x, x + step, ... (wrapping); blur <raster> h w; scale <raster> h w factor oh ow.
void trig(Text &t, Args a, Specs) {
  for (int64_t i = 0; i < a[1]; ++i) {
    const uint8_t angle = as<uint8_t>(a[0] + i);
    const int64_t v[] = {angle, tq_cos_(angle), tq_sin_(angle)};
    t.nums("angle cos sin", v, 3);
  }
}
void sqrt_rows(Text &t, Args a, Specs) {
  for (int64_t i = 0; i < a[2]; ++i) {
    const uint32_t x = as<uint32_t>(a[0] + i * a[1]);
    const int64_t v[] = {x, tq_sqrt_24_5(x)};
    t.nums("x root", v, 2);
  }
}
void blur(Text &t, Args a, Specs s, int n) {
  Raster in(s[0], a[0], a[1]), out(Spec{'c', 77}, a[0], a[1]);
  kel_blur_uint8(in.data(), as<uint16_t>(a[0]), as<uint16_t>(a[1]), n > 2 ? in.data() : out.data());
  render(t, n > 2 ? in : out);
}
void scale(Text &t, Args a, Specs s) {
  Raster in(s[0], a[0], a[1]), out(Spec{'c', 77}, a[3], a[4]);
  kel_scale_up_bilinear_uint8(in.data(), as<uint16_t>(a[0]), as<uint16_t>(a[1]), as<uint16_t>(a[2]),
                              out.data(), as<uint16_t>(a[3]), as<uint16_t>(a[4]));
  render(t, out);
}

// The routines by name, with how many numbers they take at least and at most.
struct Routine {
  const char *name;
  int min_args, max_args;
  void (*run)(Text &, Args, Specs, int);
};
template <void (*F)(Text &, Args, Specs)>
void fixed(Text &t, Args a, Specs s, int) {
  F(t, a, s);
}
const Routine kRoutines[] = {
    {"image", 4, 4, fixed<image>},    {"offset", 4, 4, fixed<offset>},
    {"rows", 2, 2, fixed<rows>},      {"pixel", 5, 5, fixed<pixel>},
    {"stats", 3, 3, fixed<stats>},    {"hstat", 4, 4, fixed<hstat>},
    {"rotate", 3, 3, fixed<rotate>},  {"point", 4, 4, fixed<point>},
    {"compose", 7, 8, compose},       {"fill", 2, 3, fill},
    {"line", 7, 7, fixed<line>},      {"triangle", 9, 9, fixed<triangle>},
    {"rect", 7, 7, fixed<rect>},      {"number", 7, 7, fixed<number>},
    {"circle", 6, 6, fixed<circle>},  {"trig", 2, 2, fixed<trig>},
    {"sqrt", 3, 3, fixed<sqrt_rows>}, {"blur", 2, 3, blur},
    {"scale", 5, 5, fixed<scale>},
};

// ---------------------------------------------------------------------------------------------
// The table: "routine args... = digest" rows, or "routine args... =" followed by "| " lines that
// spell out the expected text.
struct Row {
  const char *begin, *end;          // the row's own line
  const char *expect, *expect_end;  // digest text, or the picture lines
  bool picture;
};

const char *line_end(const char *p) {
  const char *e = strchr(p, '\n');
  return e ? e : p + strlen(p);
}

// Runs the row into t; returns false with a message when the row itself is malformed.
bool compute(const Row &row, Text &t) {
  char name[16] = {0};
  int64_t a[12];
  Spec s[4];
  int na = 0, ns = 0;
  const char *p = row.begin;
  while (p < row.end && *p != '=') {
    while (*p == ' ') ++p;
    const char *q = p;
    while (q < row.end && *q != ' ' && *q != '=') ++q;
    if (q == p) break;
    if (!name[0]) {
      memcpy(name, p, static_cast<size_t>(q - p < 15 ? q - p : 15));
    } else if ((*p >= 'a' && *p <= 'z') && ns < 4) {
      s[ns++] = Spec{*p, static_cast<uint32_t>(strtoul(p + 1, nullptr, 10))};
    } else if (na < 12) {
      a[na++] = strtoll(p, nullptr, 0);
    }
    p = q;
  }
  for (const Routine &r : kRoutines) {
    if (strcmp(r.name, name) == 0 && na >= r.min_args && na <= r.max_args) {
      r.run(t, a, s, na);
      return true;
    }
  }
  t.put("unknown routine or wrong number of arguments\n");
  return false;
}

// Splits the table into rows; calls f(row) for each.
template <typename F>
void for_each_row(const char *table, F f) {
  for (const char *p = table; *p;) {
    const char *e = line_end(p);
    if (*p != '#' && *p != '|' && e > p) {
      Row row{p, e, nullptr, nullptr, false};
      const char *eq = static_cast<const char *>(memchr(p, '=', static_cast<size_t>(e - p)));
      row.expect = eq ? eq + 1 : e;
      while (row.expect < e && *row.expect == ' ') ++row.expect;
      row.expect_end = e;
      if (eq && row.expect == e && *e) {  // a picture follows
        row.picture = true;
        const char *q = row.expect = e + 1;
        while (*q == '|') q = *line_end(q) ? line_end(q) + 1 : line_end(q);
        row.expect_end = q;
      }
      f(row);
      e = row.picture ? row.expect_end - 1 : e;
    }
    p = *e ? e + 1 : e;
  }
}

// Whether t matches the row's expectation.
bool matches(const Row &row, const Text &t) {
  if (!row.picture) {
    char hex[17];
    snprintf(hex, sizeof hex, "%016llx", static_cast<unsigned long long>(t.digest()));
    return static_cast<size_t>(row.expect_end - row.expect) == 16 &&
           memcmp(hex, row.expect, 16) == 0;
  }
  // Picture lines are "| text"; the rendered text has the same lines without the prefix.
  const char *p = row.expect, *q = t.chars ? t.chars : "";
  while (p < row.expect_end) {
    const char *e = line_end(p), *from = p + (p[1] == ' ' ? 2 : 1);
    const size_t n = static_cast<size_t>(e - from);
    if (strncmp(q, from, n) != 0 || q[n] != '\n') return false;
    q += n + 1;
    p = *e ? e + 1 : e;
  }
  return *q == 0;
}

int run_table(const char *target, int &passed) {
  int failed = 0;
  for_each_row(kTable, [&](const Row &row) {
    Text t;
    if (compute(row, t) && matches(row, t)) {
      ++passed;
      return;
    }
    ++failed;
    printf("FAILED [%s] %.*s\n", target, static_cast<int>(row.end - row.begin), row.begin);
    if (row.picture) {
      printf("%s", t.chars ? t.chars : "");
    } else {
      printf("  digest %016llx\n", static_cast<unsigned long long>(t.digest()));
    }
  });
  return failed;
}

// Writes the table with every digest recomputed; refuses when a picture row fails.
int write_table(const char *path) {
  char temp[512];
  snprintf(temp, sizeof temp, "%s.new", path);
  FILE *f = fopen(temp, "w");
  if (f == nullptr) return printf("cannot write %s\n", temp), 1;
  int bad = 0;
  const char *done = kTable;
  for_each_row(kTable, [&](const Row &row) {
    Text t;
    const bool ok = compute(row, t);
    if (row.picture) {
      if (!ok || !matches(row, t))
        ++bad, printf("picture differs: %.*s\n%s", static_cast<int>(row.end - row.begin), row.begin,
                      t.chars);
      return;
    }
    if (!ok) ++bad, printf("bad row: %.*s\n", static_cast<int>(row.end - row.begin), row.begin);
    const char *eq =
        static_cast<const char *>(memchr(row.begin, '=', static_cast<size_t>(row.end - row.begin)));
    const char *stop = eq ? eq : row.end;
    while (stop > row.begin && stop[-1] == ' ') --stop;
    fprintf(f, "%.*s = %016llx", static_cast<int>(stop - done), done,
            static_cast<unsigned long long>(t.digest()));
    done = row.end;
  });
  fputs(done, f);
  if (fclose(f) != 0 || bad)
    return remove(temp), printf("%d bad rows: %s left as it was\n", bad, path), 1;
  return rename(temp, path) == 0 ? 0 : (printf("cannot replace %s\n", path), 1);
}

}  // namespace

int main(int argc, char **argv) {
  if (argc == 3 && strcmp(argv[1], "--write") == 0) return write_table(argv[2]);
  int passed = 0, failed = 0;
  if (argc == 1) {
#if KEL_USE_HIGHWAY && !defined(HWY_COMPILE_ONLY_STATIC)
    for (const int64_t target : hwy::SupportedAndGeneratedTargets()) {
      hwy::SetSupportedTargetsForTest(target);
      failed += run_table(hwy::TargetName(target), passed);
    }
    hwy::SetSupportedTargetsForTest(0);
#else
    failed = run_table(KEL_USE_HIGHWAY ? "baseline" : "plain", passed);
#endif
  }
#if KEL_TRUTH_THREADS
  // Every thread runs the whole table at once: a routine that kept state between calls would
  // show up here as a wrong row, or as a race under ThreadSanitizer.
  else if (argc == 3 && strcmp(argv[1], "--threads") == 0) {
    std::thread threads[16];
    int counts[16][2] = {};
    const int n = atoi(argv[2]) < 16 ? atoi(argv[2]) : 16;
    for (int i = 0; i < n; ++i) {
      threads[i] = std::thread([&counts, i] { counts[i][1] = run_table("thread", counts[i][0]); });
    }
    for (int i = 0; i < n; ++i) threads[i].join(), passed += counts[i][0], failed += counts[i][1];
  }
#endif
  else {
    return printf("usage: %s [--write FILE | --threads N]\n", argv[0]), 2;
  }
  printf("%d passed, %d failed\n", passed, failed);
  return failed ? 1 : 0;
}
