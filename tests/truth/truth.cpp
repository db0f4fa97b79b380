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

#include <initializer_list>

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
    put(digits,
        static_cast<size_t>(snprintf(digits, sizeof digits, "%lld", static_cast<long long>(v))));
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
  const int64_t n = h > 0 && w > 0 ? h * w : 0;
  for (int64_t i = 0; i < n; ++i) {
    const uint32_t r = next(s) >> 8;
    const int64_t v = spec.kind == 'r'   ? r
                      : spec.kind == 'k' ? r & 3
                      : spec.kind == 'e' ? kExtremes[r % 10]
                      : spec.kind == 'g' ? 10 * (i / w) + i % w
                      : spec.kind == 'b' ? 1
                                         : spec.n;
    p[i] = static_cast<uint8_t>(v);
  }
  for (uint32_t holes = spec.kind == 'b' && n ? 1 + next(s) % 3 : 0; holes > 0; --holes) {
    const int64_t y0 = next(s) % h, x0 = next(s) % w;
    const int64_t y1 = y0 + 1 + next(s) % h, x1 = x0 + 1 + next(s) % w;
    for (int64_t y = y0; y < y1 && y < h; ++y) {
      for (int64_t x = x0; x < x1 && x < w; ++x) p[y * w + x] = 0;
    }
  }
}

// A raster with guard bytes on both sides; rendering it reports a touched guard. Its pixels start
// lead bytes past a 64-byte boundary, so that a row can put two rasters at any alignment to each
// other, as the vector loops that join misaligned reads need to be shown.
struct Raster {
  static constexpr size_t kGuard = 64;
  uint8_t *block, *pixels;
  int64_t h, w;
  size_t n, before;
  Raster(Spec spec, int64_t height, int64_t width, size_t lead = 0) : h(height), w(width) {
    n = h > 0 && w > 0 ? static_cast<size_t>(h * w) : 0;
    block = static_cast<uint8_t *>(malloc(n + 3 * kGuard + lead));
    if (block == nullptr) abort();
    before = kGuard - reinterpret_cast<uintptr_t>(block) % kGuard + lead;
    pixels = block + before;
    memset(block, 0xA5, n + 3 * kGuard + lead);
    generate(spec, data(), h, w);
  }
  ~Raster() { free(block); }
  uint8_t *data() const { return pixels; }
  bool guards_intact() const {
    for (size_t i = 0; i < before; ++i) {
      if (block[i] != 0xA5) return false;
    }
    for (size_t i = 0; i < kGuard; ++i) {
      if (pixels[n + i] != 0xA5) return false;
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
  for (size_t k = 0; k < r.n; ++k) {
    const uint8_t v = r.data()[k];
    if (v == colour || v == 255 - colour || (bg.kind == 'c' && v == bg.n)) {
      t.put(v == colour ? "X" : v == 255 - colour ? "o" : ".");
    } else {
      t.put("("), t.num(v), t.put(")");
    }
    if ((k + 1) % static_cast<size_t>(r.w) == 0) t.put("\n");
  }
  if (!r.guards_intact()) t.put("guard bytes written\n");
}

// ---------------------------------------------------------------------------------------------
// The routines. Each reads its row's numbers from a[] and its input specs from s[], each in the
// order the row gives them, and renders what the call produced into t.
struct Call {
  Text &t;
  const int64_t *a;
  const Spec *s;
  int n;  // how many numbers the row gave
  const char *name;
  int32_t i(int k) const { return static_cast<int32_t>(a[k]); }
  uint32_t u(int k) const { return static_cast<uint32_t>(a[k]); }
  uint16_t u16(int k) const { return static_cast<uint16_t>(a[k]); }
  uint8_t u8(int k) const { return static_cast<uint8_t>(a[k]); }
  int64_t distance(const void *p, const void *base) const {  // wrapped to 32 bits
    return static_cast<int32_t>(
        static_cast<uint32_t>(reinterpret_cast<uintptr_t>(p) - reinterpret_cast<uintptr_t>(base)));
  }
};

// image h w pixel_bytes stride|-1: the record (made by kel_image_create when stride is -1), its
// last pixel's offset and address, and what kel_image_clear leaves.
void image(Call &c) {
  kel_image *im = c.a[3] < 0 ? kel_image_create(c.i(0), c.i(1), c.i(2))
                             : kel_image_create_ex(c.i(0), c.i(1), c.i(2), c.i(3));
  if (im == nullptr) return c.t.put("null\n");
  const size_t bytes = static_cast<size_t>(im->height) * static_cast<size_t>(im->stride);
  memset(im->data, 0xA5, bytes);
  kel_image_clear(im);
  int64_t left = 0;
  for (size_t k = 0; k < bytes; ++k) left += im->data[k];
  const int32_t row = im->height - 1, col = im->width - 1;
  const int64_t v[] = {im->height,
                       im->width,
                       im->stride,
                       im->pixel_bytes,
                       c.distance(im->data, im + 1),
                       kel_image_offset(im, row, col),
                       c.distance(kel_image_ptr(im, row, col), im->data),
                       left};
  c.t.nums("h w stride bytes, data, last offset and address, left after clear", v, 8);
  kel_image_delete(im);
  kel_image_delete(nullptr);
}

// offset stride pixel_bytes row col: addressing in wrapping 32-bit arithmetic, on a record that
// owns no pixels (nothing is dereferenced).
void offset(Call &c) {
  uint8_t base[1];
  const kel_image im = {base, 1, 1, c.i(0), c.i(1)};
  const int64_t v[] = {kel_image_offset(&im, c.i(2), c.i(3)),
                       c.distance(kel_image_ptr(&im, c.i(2), c.i(3)), base)};
  c.t.nums("offset ptr", v, 2);
}

// rows height row_step: the row table's entries as distances from the buffer, and one entry
// beyond it that must stay untouched (-1).
void rows(Call &c) {
  static uint8_t buf[1];
  uint8_t *table[66] = {};
  int64_t v[66];
  kel_images_1D_to_2D(buf, c.u(0), c.i(1), table);
  for (int k = 0; k < 66; ++k) v[k] = table[k] ? c.distance(table[k], buf) : -1;
  c.t.nums("rows", v, c.a[0] < 65 ? c.i(0) + 1 : 66);
}

// pixel <raster> h w y x colour
void pixel(Call &c) {
  Raster r(c.s[0], c.a[0], c.a[1]);
  kel_set_pixel(r.data(), c.u(0), c.u(1), c.u(2), c.u16(3), c.u8(4));
  render(c.t, r);
}

// stats <raster> h w bits: both histograms, the image statistics (the mean stored and not) and
// the histogram statistics over the image's own pixel count.
void stats(Call &c) {
  Raster r(c.s[0], c.a[0], c.a[1]);
  const int32_t h = c.i(0), w = c.i(1);
  uint32_t hist[256], reduced[256];
  int64_t v[256];
  kel_image_histogram(r.data(), h, w, hist);
  for (uint32_t &bin : reduced) bin = 0xDEADBEEF;
  kel_image_histogram_n(r.data(), h, w, c.u(2), reduced);
  for (int k = 0; k < 256; ++k) v[k] = hist[k];
  c.t.nums("hist", v, 256);
  for (int k = 0; k < 256; ++k) v[k] = reduced[k];
  c.t.nums("reduced", v, 256);
  uint8_t mean_var = 1, mean_std = 2;
  const uint32_t count = c.u(0) * c.u(1);
  const uint8_t mean = kel_hist_mean(hist, count);
  const int64_t out[] = {kel_image_var(r.data(), h, w, &mean_var),
                         mean_var,
                         kel_image_std(r.data(), h, w, &mean_std),
                         mean_std,
                         kel_image_var(r.data(), h, w, nullptr),
                         kel_image_std(r.data(), h, w, nullptr),
                         mean,
                         kel_hist_var(hist, mean, count),
                         kel_hist_std(hist, mean, count)};
  c.t.nums("var mean std mean var std hmean hvar hstd", out, 9);
  if (!r.guards_intact()) c.t.put("guard bytes written\n");
}

// hstat seed scale count|-1 mean|-1: statistics of a histogram of random bins below scale (any
// 32-bit value for 0), over count pixels (their sum for -1), about mean (the computed one for -1).
void hstat(Call &c) {
  uint32_t hist[256], sum = 0, seed = c.u(0) * 2654435761u + 7;
  for (uint32_t &bin : hist) sum += bin = c.a[1] ? next(seed) % c.u(1) : next(seed);
  const uint32_t count = c.a[2] < 0 ? sum : c.u(2);
  const uint8_t mean = c.a[3] < 0 ? kel_hist_mean(hist, count) : c.u8(3);
  const int64_t v[] = {kel_hist_mean(hist, count), kel_hist_var(hist, mean, count),
                       kel_hist_std(hist, mean, count)};
  c.t.nums("mean var std", v, 3);
}

// Whether the heap-free rotations, into a buffer one byte larger than asked whose last byte must
// stay untouched, give the canvases and geometry the heap-using ones gave.
bool same_as_heap_free(const Call &c, const Raster &r, uint8_t *const canvas[3],
                       const int32_t g[3][4]) {
  kel_canvas geometry;
  const size_t bytes =
      kel_rotation_canvas(c.a[0] & 0xFFFFFFFF, c.a[1] & 0xFFFFFFFF, c.u8(2), &geometry);
  if (bytes == 0) return canvas[0] == nullptr && g[0][0] == 0 && g[0][1] == 0;
  uint8_t *pixels = static_cast<uint8_t *>(malloc(bytes + 1));
  if (pixels == nullptr) return true;  // nothing to compare with
  const auto *signed_src = reinterpret_cast<const int8_t *>(r.data());
  auto *signed_pixels = reinterpret_cast<int8_t *>(pixels);
  bool same = true;
  for (int kind = 0; kind < 2; ++kind) {
    pixels[bytes] = 0xA5;
    if (kind == 0)
      kel_image_rotate_into(r.data(), c.u(0), c.u(1), c.u8(2), &geometry, pixels, bytes);
    if (kind == 1) {
      kel_image_rotate_int8_into(signed_src, c.u(0), c.u(1), c.u8(2), &geometry, signed_pixels,
                                 bytes);
    }
    same = same && canvas[kind] != nullptr && pixels[bytes] == 0xA5 &&
           !memcmp(pixels, canvas[kind], bytes) && geometry.height == g[kind][0] &&
           geometry.width == g[kind][1] && geometry.offset_y == g[kind][2] &&
           geometry.offset_x == g[kind][3];
  }
  free(pixels);
  // The nearest-neighbour rotation reads its sizes as signed; its canvas may differ in size.
  const size_t nn_bytes = kel_rotation_canvas(c.i(0), c.i(1), c.u8(2), &geometry);
  pixels = static_cast<uint8_t *>(malloc(nn_bytes + 1));
  if (nn_bytes == 0 || pixels == nullptr) {
    free(pixels);
    return same && (nn_bytes != 0 || canvas[2] == nullptr);
  }
  pixels[nn_bytes] = 0xA5;
  kel_image_rotate_int8_nn_into(signed_src, c.i(0), c.i(1), c.u8(2), &geometry,
                                reinterpret_cast<int8_t *>(pixels), nn_bytes);
  same = same && canvas[2] != nullptr && pixels[nn_bytes] == 0xA5 &&
         !memcmp(pixels, canvas[2], nn_bytes);
  free(pixels);
  return same;
}

// rotate <raster> h w angle: the three rotations of the same bytes (read as signed for the
// int8 ones), each canvas with its size, the source corner's position and whether it was made.
void rotate(Call &c) {
  Raster r(c.s[0], c.a[0], c.a[1]);
  const auto *signed_src = reinterpret_cast<const int8_t *>(r.data());
  uint8_t *canvas[3] = {};
  auto **signed_canvas = reinterpret_cast<int8_t **>(canvas);
  int32_t g[3][4];
  kel_image_rotate(r.data(), c.u(0), c.u(1), c.u8(2), canvas, g[0], g[0] + 1, g[0] + 2, g[0] + 3);
  kel_image_rotate_int8(signed_src, c.u(0), c.u(1), c.u8(2), signed_canvas + 1, g[1], g[1] + 1,
                        g[1] + 2, g[1] + 3);
  kel_image_rotate_int8_nn(signed_src, c.i(0), c.i(1), c.u8(2), signed_canvas + 2, g[2], g[2] + 1,
                           g[2] + 2, g[2] + 3);
  for (int kind = 0; kind < 3; ++kind) {
    const int64_t geometry[] = {g[kind][0], g[kind][1], g[kind][2], g[kind][3],
                                canvas[kind] != nullptr};
    c.t.nums(kind == 0 ? "u8 canvas h w, offset y x, made" : kind == 1 ? "s8" : "nn", geometry, 5);
  }
  // The canvases row by row side by side, u8 | s8 | nn, where all three have the same size.
  const bool alike = canvas[0] && canvas[1] && canvas[2] && !memcmp(g[0], g[1], sizeof g[0]) &&
                     !memcmp(g[0], g[2], sizeof g[0]);
  for (int64_t y = 0; y < (alike ? g[0][0] : 0); ++y) {
    for (int kind = 0; kind < 3; ++kind) {
      if (kind) c.t.put(" |");
      for (int64_t x = 0; x < g[0][1]; ++x) {
        const uint8_t v = canvas[kind][y * g[0][1] + x];
        c.t.put(x || kind ? " " : ""), c.t.num(kind ? static_cast<int8_t>(v) : v);
      }
    }
    c.t.put("\n");
  }
  for (int kind = 0; kind < 3; ++kind) {
    if (canvas[kind] && !alike) render(c.t, canvas[kind], g[kind][0], g[kind][1], kind > 0);
  }
  if (!same_as_heap_free(c, r, canvas, g)) c.t.put("heap-free rotation differs\n");
  for (uint8_t *made : canvas) free(made);
  if (!r.guards_intact()) c.t.put("guard bytes written\n");
}

// point <raster> h w percent key [lead]: brighten, darken and the key's mask, each into a second
// raster and in place (the two must agree); the source lies lead bytes off the output's alignment.
void point(Call &c) {
  static const char *const kLabels[] = {"brighten\n", "darken\n", "mask\n"};
  const size_t lead = c.n > 4 ? static_cast<size_t>(c.a[4] & 63) : 0;
  for (int op = 0; op < 3; ++op) {
    Raster src(c.s[0], c.a[0], c.a[1], lead), out(Spec{'c', 77}, c.a[0], c.a[1]);
    for (uint8_t *dst : {out.data(), src.data()}) {
      if (op == 0) kel_image_brighten(src.data(), c.u(0), c.u(1), c.u(2), dst);
      if (op == 1) kel_image_darken(src.data(), c.u(0), c.u(1), c.u(2), dst);
      if (op == 2) kel_get_mask(src.data(), c.u(0), c.u(1), c.i(3), dst);
    }
    c.t.put(kLabels[op]);
    render(c.t, out);
    if (memcmp(src.data(), out.data(), out.n) || !src.guards_intact())
      c.t.put("in place differs\n");
  }
}

// compose <dst> dh dw <src> sh sw x y key [overlap]: paste, then blend, of src onto dst; with
// overlap the source is dst's own memory from that byte on.
void compose(Call &c) {
  for (auto call : {kel_image_draw_image, kel_image_blend_image}) {
    Raster dst(c.s[0], c.a[0], c.a[1]), src(c.s[1], c.a[2], c.a[3]);
    const uint8_t *from = c.n > 7 ? dst.data() + c.a[7] : src.data();
    call(dst.data(), c.i(0), c.i(1), from, c.u16(2), c.u16(3), c.i(4), c.i(5), c.u16(6));
    c.t.put(call == kel_image_draw_image ? "paste\n" : "blend\n");
    render(c.t, dst);
  }
}

// fill <raster> h w <mask> [in place]: the masked fill.
void fill(Call &c) {
  Raster src(c.s[0], c.a[0], c.a[1]), mask(c.s[1], c.a[0], c.a[1]),
      dst(Spec{'c', 77}, c.a[0], c.a[1]);
  Raster &out = c.n > 2 ? src : dst;
  // The heap-free twin on copies of the same inputs, from a scratch block one byte off its
  // alignment, must give the same bytes.
  Raster twin_src(c.s[0], c.a[0], c.a[1]), twin_dst(Spec{'c', 77}, c.a[0], c.a[1]);
  Raster &twin_out = c.n > 2 ? twin_src : twin_dst;
  const size_t scratch_bytes = kel_mask_image_scratch_size(c.u16(0), c.u16(1));
  auto *scratch = static_cast<uint8_t *>(malloc(scratch_bytes + 1));
  const bool twin_made = scratch != nullptr;
  if (twin_made) {
    kel_mask_image_into(twin_src.data(), c.u16(0), c.u16(1), mask.data(), twin_out.data(),
                        scratch + 1, scratch_bytes);
  }
  free(scratch);
  kel_mask_image(src.data(), c.u16(0), c.u16(1), mask.data(), out.data());
  render(c.t, out);
  if (twin_made && memcmp(twin_out.data(), out.data(), out.n)) {
    c.t.put("heap-free fill differs\n");
  }
}

// Drawings: <background> h w, then the routine's own arguments, colour last.
void drawing(Call &c) {
  Raster r(c.s[0], c.a[0], c.a[1]);
  uint8_t *p = r.data();
  const uint8_t colour = c.u8(c.n - 1);
  const char f = c.name[0];
  if (f == 'l') kel_image_draw_line(p, c.i(0), c.i(1), c.i(2), c.i(3), c.i(4), c.i(5), colour);
  if (f == 'r') kel_image_draw_rectangle(p, c.i(0), c.i(1), c.i(2), c.i(3), c.u(4), c.u(5), colour);
  if (f == 'n') kel_image_draw_number(p, c.i(0), c.i(1), c.i(2), c.u8(3), c.i(4), c.i(5), colour);
  if (f == 'c') kel_image_draw_circle(p, c.i(0), c.i(1), c.u(2), c.i(3), c.i(4), colour);
  if (f == 't') {
    kel_image_draw_triangle(p, c.i(0), c.i(1), c.i(2), c.i(3), c.i(4), c.i(5), c.i(6), c.i(7),
                            colour);
  }
  render_drawing(c.t, r, c.s[0], colour);
}

// The outside functions. trig first count: cosine and sine of consecutive angles; sqrt x step
// count: roots of x, x + step, ... (wrapping); blur <raster> h w [in place];
// scale <raster> h w factor out_h out_w.
void trig(Call &c) {
  for (int64_t k = 0; k < c.a[1]; ++k) {
    const auto angle = static_cast<uint8_t>(c.a[0] + k);
    const int64_t v[] = {angle, tq_cos_(angle), tq_sin_(angle)};
    c.t.nums("angle cos sin", v, 3);
  }
}
void sqrt_rows(Call &c) {
  for (int64_t k = 0; k < c.a[2]; ++k) {
    const auto x = static_cast<uint32_t>(c.a[0] + k * c.a[1]);
    const int64_t v[] = {x, tq_sqrt_24_5(x)};
    c.t.nums("x root", v, 2);
  }
}
void blur(Call &c) {
  Raster in(c.s[0], c.a[0], c.a[1]), out(Spec{'c', 77}, c.a[0], c.a[1]);
  kel_blur_uint8(in.data(), c.u16(0), c.u16(1), c.n > 2 ? in.data() : out.data());
  render(c.t, c.n > 2 ? in : out);
}
void scale(Call &c) {
  Raster in(c.s[0], c.a[0], c.a[1]), out(Spec{'c', 77}, c.a[3], c.a[4]);
  kel_scale_up_bilinear_uint8(in.data(), c.u16(0), c.u16(1), c.u16(2), out.data(), c.u16(3),
                              c.u16(4));
  render(c.t, out);
}

// The routines by name, with how many numbers they take at least and at most.
struct Routine {
  const char *name;
  int min_args, max_args;
  void (*run)(Call &);
};
const Routine kRoutines[] = {
    {"image", 4, 4, image},   {"offset", 4, 4, offset},  {"rows", 2, 2, rows},
    {"pixel", 5, 5, pixel},   {"stats", 3, 3, stats},    {"hstat", 4, 4, hstat},
    {"rotate", 3, 3, rotate}, {"point", 4, 5, point},    {"compose", 7, 8, compose},
    {"fill", 2, 3, fill},     {"line", 7, 7, drawing},   {"triangle", 9, 9, drawing},
    {"rect", 7, 7, drawing},  {"number", 7, 7, drawing}, {"circle", 6, 6, drawing},
    {"trig", 2, 2, trig},     {"sqrt", 3, 3, sqrt_rows}, {"blur", 2, 3, blur},
    {"scale", 5, 5, scale},
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
      Call call{t, a, s, na, name};
      r.run(call);
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
                      t.chars ? t.chars : "");
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
