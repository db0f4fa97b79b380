// One libFuzzer harness over every exported function and the outside defaults. The first byte
// picks a family; the rest decodes into sizes (mostly small, sometimes extreme), coordinates
// (near the raster, or where 32-bit arithmetic breaks) and pixels. Every buffer sits between
// guard bytes, and each family checks a cheap model of its result; ASan and UBSan see the rest.
// KEL_FUZZ_TRACE=1 prints the family and arguments of each input.
#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <vector>

#include "kel_images.h"
#include "kel_outside.h"

namespace {

#define CHECK(c) ((c) ? void(0) : (fprintf(stderr, "%s:%d: %s\n", __FILE__, __LINE__, #c), abort()))
#define TRACE(...) (getenv("KEL_FUZZ_TRACE") ? void(fprintf(stderr, __VA_ARGS__)) : void(0))

// Reads the input front to back; past its end every read yields 0.
struct Reader {
  const uint8_t *data;
  size_t length, pos = 0;
  uint8_t byte() { return pos < length ? data[pos++] : 0; }
  uint32_t u32() {
    return byte() | uint32_t(byte()) << 8 | uint32_t(byte()) << 16 | uint32_t(byte()) << 24;
  }
  uint32_t u16() { return byte() | uint32_t(byte()) << 8; }
  int32_t small(int32_t n) { return int32_t(u16() % uint32_t(n + 1)); }
  // Mostly within reach of 0 .. extent, sometimes an extreme, sometimes anything.
  int32_t coordinate(int32_t extent, int32_t reach = 16) {
    static const int32_t kExtremes[] = {INT32_MIN, INT32_MIN + 1, -65536,        -1,
                                        0,         65535,         INT32_MAX - 1, INT32_MAX};
    const uint8_t s = byte();
    if (s < 200) return int32_t(u16() % (int64_t{extent > 0 ? extent : 0} + 2 * reach + 1) - reach);
    return s < 240 ? kExtremes[s % 8] : int32_t(u32());
  }
  uint32_t size(int32_t n) {
    static const uint32_t kExtremes[] = {0, 1, 2, 65535, 65536, 0x7fffffff, 0x80000000, 0xffffffff};
    const uint8_t s = byte();
    return s < 220 ? uint32_t(small(n)) : s < 250 ? kExtremes[s % 8] : u32();
  }
  // Few distinct values for some inputs, so that keys and masks meet the pixels.
  void pixels(uint8_t *p, size_t n) {
    const uint8_t palette = byte();
    uint32_t s = u32() | 1;
    for (size_t i = 0; i < n; ++i) {
      s ^= s << 13, s ^= s >> 17, s ^= s << 5;
      p[i] = uint8_t(pos < length ? byte() : s >> 24);
      if (palette < 96) p[i] = uint8_t(p[i] % (palette % 4 + 2));
    }
  }
};

// n bytes between guard zones that no call may touch.
struct Guarded {
  static constexpr size_t kGuard = 32;
  std::vector<uint8_t> bytes;
  size_t n;
  explicit Guarded(size_t count, uint8_t fill = 0) : bytes(count + 2 * kGuard, 0xA5), n(count) {
    memset(data(), fill, n);
  }
  uint8_t *data() { return bytes.data() + kGuard; }
  uint8_t &at(int64_t x, int64_t y, int64_t w) { return data()[y * w + x]; }
  void check() const {
    for (size_t i = 0; i < kGuard; ++i) CHECK(bytes[i] == 0xA5 && bytes[kGuard + n + i] == 0xA5);
  }
};
size_t count(int64_t h, int64_t w) {
  return h > 0 && w > 0 ? size_t(h * w) : 0;
}

void image(Reader &in) {
  const int32_t h = in.coordinate(20), w = in.coordinate(20), pb = in.coordinate(4, 2),
                extra = in.small(9);
  const int64_t row = int64_t(w) * pb,
                stride = in.byte() & 1 ? row + extra : int64_t(in.coordinate(90));
  const bool valid = h >= 0 && w >= 0 && pb >= 0 && row <= INT32_MAX && stride >= row &&
                     stride <= INT32_MAX && int64_t(h) * stride <= INT32_MAX;
  TRACE("image %d %d %d %lld\n", h, w, pb, (long long)stride);
  if (valid && int64_t(h) * stride > (1 << 22)) return;  // a legal but needlessly large block
  kel_image *im = stride == row && in.byte() & 1 ? kel_image_create(h, w, pb)
                                                 : kel_image_create_ex(h, w, pb, int32_t(stride));
  CHECK((im != nullptr) == valid);
  if (im == nullptr) return;
  CHECK(im->height == h && im->width == w && im->pixel_bytes == pb && im->stride == stride);
  memset(im->data, 7, size_t(h) * size_t(stride));
  kel_image_clear(im);
  for (int64_t i = 0; i < int64_t(h) * stride; ++i) CHECK(im->data[i] == 0);
  const int32_t r = in.coordinate(h), c = in.coordinate(w);
  const int32_t offset = int32_t(uint32_t(r) * uint32_t(stride) + uint32_t(c) * uint32_t(pb));
  CHECK(kel_image_offset(im, r, c) == offset);
  if (r >= 0 && r < h && c >= 0 && c < w) CHECK(kel_image_ptr(im, r, c) == im->data + offset);
  kel_image_delete(im);
}

void pixel(Reader &in) {
  const uint32_t ph = in.size(12), pw = in.size(12), y = in.size(14);
  const uint16_t x = uint16_t(in.size(14));
  const uint8_t colour = in.byte();
  TRACE("pixel %u %u %u %u\n", ph, pw, y, x);
  if (uint64_t(ph) * pw > 4096) return;
  Guarded r(size_t(ph) * pw, uint8_t(~colour));
  kel_set_pixel(r.data(), ph, pw, y, x, colour);
  for (size_t i = 0; i < r.n; ++i)
    CHECK((r.data()[i] == colour) == (y < ph && x < pw && i == y * pw + x));
  r.check();
}

void statistics(Reader &in) {
  const int32_t h = in.small(40) - 2, w = in.small(70) - 2;
  const uint32_t bits = in.size(10);
  if (h < 0 && w < 0) return;  // a positive product: the caller's to avoid
  Guarded src(count(h, w));
  in.pixels(src.data(), src.n);
  TRACE("statistics %d %d %u\n", h, w, bits);
  uint32_t hist[256], reduced[257];
  for (uint32_t &b : reduced) b = 0xBEEF;
  kel_image_histogram(src.data(), h, w, hist);
  kel_image_histogram_n(src.data(), h, w, bits, reduced);
  const uint32_t used = bits > 8 ? 8 : bits;
  uint64_t weighted = 0, total = 0;
  for (uint32_t i = 0; i < 256; ++i) {
    uint32_t folded = 0;
    for (uint32_t j = i << (8 - used); j < (i + 1) << (8 - used) && i < 1u << used; ++j)
      folded += hist[j];
    CHECK(reduced[i] == (i < 1u << used ? folded : 0xBEEF));
    weighted += uint64_t(i) * hist[i], total += hist[i];
  }
  CHECK(reduced[256] == 0xBEEF && total == src.n);
  const uint32_t n = uint32_t(src.n);
  const uint8_t mean = kel_hist_mean(hist, n);
  CHECK(mean == (n ? uint8_t(uint32_t(weighted) / n) : 0));
  uint64_t spread = 0;
  for (int i = 0; i < 256; ++i) spread += uint64_t(hist[i]) * uint64_t((i - mean) * (i - mean));
  const uint16_t var = kel_hist_var(hist, mean, n);
  CHECK(var == (n ? uint16_t(uint32_t(spread) / n) : 0));
  const uint8_t sd = kel_hist_std(hist, mean, n);
  CHECK(uint32_t(sd) * sd <= var && uint32_t(sd + 1) * (sd + 1) > var);
  uint8_t m1 = 1, m2 = 2;
  CHECK(kel_image_var(src.data(), h, w, &m1) == var && m1 == mean);
  CHECK(kel_image_std(src.data(), h, w, &m2) == sd && m2 == mean);
  src.check();
}

// Sides up to 40 (down to -40 for the nearest-neighbour rotation, which takes negative ones), or
// sides so vast that no canvas can be described: anything between asks for gigabytes.
void rotation(Reader &in) {
  const uint8_t kind = in.byte() % 3, angle = in.byte();
  const uint32_t h = in.size(40), w = in.size(40);
  const bool vast = kind != 2 && (h >= 0xC0000000u || w >= 0xC0000000u);
  const bool small = kind == 2 ? h + 40u <= 80u && w + 40u <= 80u : h <= 40 && w <= 40;
  if (!small && !vast) return;
  const size_t n = small ? count(int32_t(h), int32_t(w)) : 0;
  Guarded src(n);
  in.pixels(src.data(), src.n);
  TRACE("rotation %d %u %u %d\n", kind, h, w, angle);
  uint8_t *canvas = nullptr;
  int32_t ch = -1, cw = -1, oy = -1, ox = -1;
  auto **sc = reinterpret_cast<int8_t **>(&canvas);
  const auto *ss = reinterpret_cast<const int8_t *>(src.data());
  if (kind == 0) kel_image_rotate(src.data(), h, w, angle, &canvas, &ch, &cw, &oy, &ox);
  if (kind == 1) kel_image_rotate_int8(ss, h, w, angle, sc, &ch, &cw, &oy, &ox);
  if (kind == 2)
    kel_image_rotate_int8_nn(ss, int32_t(h), int32_t(w), angle, sc, &ch, &cw, &oy, &ox);
  src.check();
  if (canvas == nullptr) return CHECK(vast && ch == 0 && cw == 0 && oy == 0 && ox == 0);
  CHECK(ch >= 1 && cw >= 1 && oy >= 0 && ox >= 0 && oy < ch && ox < cw);
  const int64_t keep = kind == 2 ? 0 : 1;  // the bilinear ones never reach the last row and column
  for (int64_t y = 0; angle == 0 && n && y + keep < h; ++y) {
    for (int64_t x = 0; x + keep < w; ++x) {
      const uint8_t v = src.at(x, y, w);
      CHECK(canvas[y * cw + x] == (kind == 2 && v == 0x80 ? 0x81 : v));
    }
  }
  free(canvas);
}

void point(Reader &in) {
  const uint32_t h = in.size(40), w = in.size(70), percent = in.size(110);
  const int32_t key = in.coordinate(256, 4);
  if (uint64_t(h) * w > 4096) return;
  Guarded src(size_t(h) * w), dst(src.n), twin(src.n);
  in.pixels(src.data(), src.n);
  TRACE("point %u %u %u %d\n", h, w, percent, key);
  const uint32_t p = percent > 100 ? 100 : percent;
  for (int op = 0; op < 3; ++op) {
    twin.bytes = src.bytes;
    if (op == 0)
      kel_image_brighten(src.data(), h, w, percent, dst.data()),
          kel_image_brighten(twin.data(), h, w, percent, twin.data());
    if (op == 1)
      kel_image_darken(src.data(), h, w, percent, dst.data()),
          kel_image_darken(twin.data(), h, w, percent, twin.data());
    if (op == 2)
      kel_get_mask(src.data(), h, w, key, dst.data()),
          kel_get_mask(twin.data(), h, w, key, twin.data());
    for (size_t i = 0; i < src.n; ++i) {
      const uint32_t s = src.data()[i];
      const uint32_t model = op == 0   ? s + p * (255 - s) / 100
                             : op == 1 ? s - p * s / 100
                                       : s != uint32_t(key);
      CHECK(dst.data()[i] == model && twin.data()[i] == model);
    }
    dst.check(), twin.check();
  }
}

void compose(Reader &in) {
  const int32_t dh = in.coordinate(30, 4), dw = in.coordinate(40, 4);
  const uint16_t sh = uint16_t(in.small(30)), sw = uint16_t(in.small(40));
  const int32_t x = in.coordinate(dw), y = in.coordinate(dh);
  const uint16_t key = uint16_t(in.byte() < 128 ? in.byte() : in.byte() | 256);
  const bool blend = in.byte() & 1;
  if (count(dh, dw) > 4096) return;
  Guarded dst(count(dh, dw)), src(size_t(sh) * sw);
  in.pixels(dst.data(), dst.n), in.pixels(src.data(), src.n);
  TRACE("compose %d %d %d %d %d %d %d %d\n", blend, dh, dw, sh, sw, x, y, key);
  Guarded model = dst;
  for (int64_t sy = 0; sy < sh; ++sy) {
    for (int64_t sx = 0; sx < sw; ++sx) {
      const int64_t tx = x + sx, ty = y + sy;
      const uint8_t s = src.at(sx, sy, sw);
      if (tx < 0 || ty < 0 || tx >= dw || ty >= dh || s == key) continue;
      uint8_t &d = model.at(tx, ty, dw);
      d = uint8_t(blend ? (d + s) >> 1 : s);
    }
  }
  (blend ? kel_image_blend_image : kel_image_draw_image)(dst.data(), dh, dw, src.data(), sh, sw, x,
                                                         y, key);
  CHECK(dst.bytes == model.bytes);
  src.check();
}

void fill(Reader &in) {
  const uint16_t h = uint16_t(in.small(40)), w = uint16_t(in.small(40));
  const bool in_place = in.byte() & 1;
  Guarded src(size_t(h) * w), mask(src.n), dst(src.n, 99);
  in.pixels(src.data(), src.n), in.pixels(mask.data(), mask.n);
  TRACE("fill %d %d %d\n", h, w, in_place);
  Guarded &out = in_place ? src : dst;
  const Guarded before = src;
  kel_mask_image(src.data(), h, w, mask.data(), out.data());
  for (size_t i = 0; i < src.n; ++i)
    CHECK(mask.data()[i] == 0 || out.data()[i] == before.bytes[Guarded::kGuard + i]);
  out.check(), mask.check();
}

// A figure must put the same pixels into a raster as into a larger one around it.
void drawing(Reader &in) {
  const uint8_t figure = in.byte() % 5, colour = in.byte();
  const int32_t h = in.coordinate(24, 3), w = in.coordinate(24, 3);
  int32_t c[6];
  for (int i = 0; i < 6; ++i) c[i] = in.coordinate(i % 2 ? h : w);
  const uint32_t d = in.size(40);
  const uint8_t digits = in.byte() % 12;
  TRACE("drawing %d %d %d %d %d %d %d %d %d %u\n", figure, h, w, c[0], c[1], c[2], c[3], c[4], c[5],
        d);
  if (count(h, w) > 4096) return;
  const int32_t m = 5;
  auto draw = [&](uint8_t *buf, int32_t bh, int32_t bw, int32_t s) {
    if (figure == 0)
      kel_image_draw_line(buf, bh, bw, c[0] + s, c[1] + s, c[2] + s, c[3] + s, colour);
    if (figure == 1)
      kel_image_draw_triangle(buf, bh, bw, c[0] + s, c[1] + s, c[2] + s, c[3] + s, c[4] + s,
                              c[5] + s, colour);
    if (figure == 2)
      kel_image_draw_rectangle(buf, bh, bw, c[0] + s, c[1] + s, d, uint32_t(c[2]) % 64, colour);
    if (figure == 3)
      kel_image_draw_number(buf, bh, bw, c[2] % 1000000000, digits, c[0] + s, c[1] + s, colour);
    if (figure == 4) kel_image_draw_circle(buf, bh, bw, d, c[0] + s, c[1] + s, colour);
  };
  Guarded small(count(h, w), 1);
  draw(small.data(), h, w, 0);
  small.check();
  if (small.n == 0) return;
  for (int32_t v : c) {
    if (v < -(1 << 30) || v > (1 << 30)) return;  // the shifted figure would not be the same one
  }
  const int32_t bh = h + 2 * m, bw = w + 2 * m;
  Guarded big(count(bh, bw), 1);
  draw(big.data(), bh, bw, m);
  for (int64_t y = 0; y < h; ++y) {
    for (int64_t x = 0; x < w; ++x) CHECK(small.at(x, y, w) == big.at(x + m, y + m, bw));
  }
  big.check();
}

void outside(Reader &in) {
  const uint8_t a = in.byte();
  CHECK(tq_cos_(a) == tq_cos_(uint8_t(-a)) && tq_sin_(a) == -tq_sin_(uint8_t(-a)));
  CHECK(tq_cos_(a) >= -16384 && tq_cos_(a) <= 16384 && tq_sin_(a) >= -16384 && tq_sin_(a) <= 16384);
  const uint32_t x = in.u32();
  const uint64_t r = tq_sqrt_24_5(x);  // sqrt(x) / 128 rounded down
  CHECK(r * r * 16384 <= x && (r + 1) * (r + 1) * 16384 > x);
  const uint16_t h = uint16_t(in.small(30)), w = uint16_t(in.small(30)), f = uint16_t(in.small(9));
  const uint16_t oh = uint16_t(h * f + in.small(3)), ow = uint16_t(w * f + in.small(3));
  TRACE("outside %d %u %d %d %d %d %d\n", a, x, h, w, f, oh, ow);
  Guarded src(size_t(h) * w), out(src.n), big(size_t(oh) * ow);
  in.pixels(src.data(), src.n);
  kel_blur_uint8(src.data(), h, w, out.data());
  kel_scale_up_bilinear_uint8(src.data(), h, w, f, big.data(), oh, ow);
  kel_blur_uint8(src.data(), h, w, src.data());
  CHECK(src.bytes == out.bytes);
  big.check();
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size) {
  Reader in{data, size};
  static void (*const kFamilies[])(Reader &) = {image,   pixel, statistics, rotation, point,
                                                compose, fill,  drawing,    outside};
  kFamilies[in.byte() % 9](in);
  return 0;
}
