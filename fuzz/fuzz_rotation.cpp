// The three rotations against a plain per-pixel model: canvas size and offsets from a fresh
// geometry calculation, every canvas pixel from the inverse mapping computed afresh, the source
// fenced by guards, every canvas byte written under ASan, the canvas freed.
#include <cstdint>
#include <cstdlib>
#include <cstring>

#include "fuzz_support.h"
#include "kel_images.h"
#include "kel_outside.h"

namespace {

using kel_fuzz::Guarded;
using kel_fuzz::Reader;

constexpr int64_t kOne = 16384;
// Canvases beyond this are valid but too slow to model on every run; they are skipped.
constexpr int64_t kLargestCanvas = int64_t{1} << 20;

int64_t clamped(int32_t value) {
  return value < -kOne ? -kOne : (value > kOne ? kOne : value);
}

struct Geometry {
  int64_t height, width, offset_y, offset_x;
};

Geometry model_geometry(int64_t h, int64_t w, uint8_t angle) {
  const int64_t c = clamped(tq_cos_(angle)), s = clamped(tq_sin_(angle));
  // Integer division truncates toward zero, as the turned corners require.
  const int64_t xs[4] = {0, c * w / kOne, -(s * h / kOne), (c * w - s * h) / kOne};
  const int64_t ys[4] = {0, s * w / kOne, c * h / kOne, (s * w + c * h) / kOne};
  int64_t x_min = 0, x_max = 0, y_min = 0, y_max = 0;
  for (int i = 1; i < 4; ++i) {
    x_min = xs[i] < x_min ? xs[i] : x_min;
    x_max = xs[i] > x_max ? xs[i] : x_max;
    y_min = ys[i] < y_min ? ys[i] : y_min;
    y_max = ys[i] > y_max ? ys[i] : y_max;
  }
  return {y_max - y_min + 1, x_max - x_min + 1, -y_min, -x_min};
}

enum class Kind { kUnsigned, kSigned, kNearest };

// The model's value of canvas pixel (k, r), or the fill.
int32_t model_pixel(Kind kind, const uint8_t *src, int64_t h, int64_t w, const Geometry &g,
                    int64_t cos_b, int64_t sin_b, int64_t k, int64_t r) {
  const int64_t dx = k - g.offset_x, dy = r - g.offset_y;
  const int64_t sx = cos_b * dx - sin_b * dy, sy = sin_b * dx + cos_b * dy;
  const int64_t x0 = sx >> 14, y0 = sy >> 14;  // arithmetic shifts: rounding down
  auto at = [&](int64_t x, int64_t y) -> int32_t {
    const uint8_t byte = src[y * w + x];
    return kind == Kind::kUnsigned ? byte : static_cast<int8_t>(byte);
  };
  if (kind == Kind::kNearest) {
    if (x0 < 0 || y0 < 0 || x0 >= w || y0 >= h) return -128;
    const int32_t v = at(x0, y0);
    return v == -128 ? -127 : v;
  }
  const int32_t fill = kind == Kind::kUnsigned ? 255 : 0;
  if (x0 < 0 || x0 + 1 >= w || y0 < 0 || y0 + 1 >= h) return fill;
  const int64_t fx = sx & (kOne - 1), fy = sy & (kOne - 1);
  const int64_t top = (kOne - fx) * at(x0, y0) + fx * at(x0 + 1, y0);
  const int64_t bottom = (kOne - fx) * at(x0, y0 + 1) + fx * at(x0 + 1, y0 + 1);
  const int64_t total = (kOne - fy) * top + fy * bottom;
  return static_cast<int32_t>(total / (int64_t{1} << 28));  // truncating toward zero
}

// Source sides: mostly up to 48, sometimes an extreme, which then comes with an empty other side
// (the source must hold height * width pixels).
void source_sides(Reader &in, Kind kind, int64_t &h, int64_t &w) {
  if (kind == Kind::kNearest) {
    static constexpr int32_t kExtremes[] = {INT32_MIN, -16384, -2, -1, 16384, 65535, INT32_MAX};
    auto side = [&in]() -> int64_t {
      const uint8_t selector = in.byte();
      if (selector < 210) return in.in_range(-2, 48);
      if (selector < 245) return kExtremes[selector % (sizeof kExtremes / sizeof kExtremes[0])];
      return in.i32();
    };
    h = side();
    w = side();
  } else {
    h = in.size(48);
    w = in.size(48);
  }
  if (h > 0 && w > 0 && (h > 48 * 48 || w > 48 * 48 || h * w > 48 * 48)) {
    (in.byte() & 1 ? h : w) = 0;
  }
}

void fuzz_one(Reader &in) {
  const Kind kind = static_cast<Kind>(in.byte() % 3);
  int64_t h, w;
  source_sides(in, kind, h, w);
  const uint8_t angle = in.byte();
  const size_t n = kel_fuzz::pixel_count(h, w);
  Guarded src(n);
  in.pixels(src.data(), n);
  Guarded before(n);
  before.copy_from(src);

  const Geometry g = model_geometry(h, w, angle);
  const bool representable = g.height <= INT32_MAX && g.width <= INT32_MAX;
  if (representable && g.height * g.width > kLargestCanvas) return;

  KEL_TRACE("rotate kind=%d h=%lld w=%lld angle=%u\n", static_cast<int>(kind),
            static_cast<long long>(h), static_cast<long long>(w), unsigned{angle});
  // Outputs start as a recognisable value so that an output left unwritten is seen.
  void *canvas = reinterpret_cast<void *>(uintptr_t{0xdead});
  int32_t canvas_height = -7, canvas_width = -7, offset_y = -7, offset_x = -7;
  switch (kind) {
    case Kind::kUnsigned:
      kel_image_rotate(src.data(), static_cast<uint32_t>(h), static_cast<uint32_t>(w), angle,
                       reinterpret_cast<uint8_t **>(&canvas), &canvas_height, &canvas_width,
                       &offset_y, &offset_x);
      break;
    case Kind::kSigned:
      kel_image_rotate_int8(src.signed_data(), static_cast<uint32_t>(h), static_cast<uint32_t>(w),
                            angle, reinterpret_cast<int8_t **>(&canvas), &canvas_height,
                            &canvas_width, &offset_y, &offset_x);
      break;
    case Kind::kNearest:
      kel_image_rotate_int8_nn(src.signed_data(), static_cast<int32_t>(h), static_cast<int32_t>(w),
                               angle, reinterpret_cast<int8_t **>(&canvas), &canvas_height,
                               &canvas_width, &offset_y, &offset_x);
      break;
  }
  src.check();
  KEL_CHECK(src.same_pixels(before));  // the source is only read

  if (!representable) {
    KEL_CHECK(canvas == nullptr);
    KEL_CHECK(canvas_height == 0 && canvas_width == 0 && offset_y == 0 && offset_x == 0);
    return;
  }
  KEL_CHECK(canvas != nullptr);
  KEL_CHECK(canvas_height == g.height && canvas_width == g.width);
  KEL_CHECK(offset_y == g.offset_y && offset_x == g.offset_x);
  KEL_CHECK(canvas_height > 0 && canvas_width > 0 && offset_y >= 0 && offset_x >= 0);

  const uint8_t opposite = static_cast<uint8_t>(-angle & 255);
  const int64_t cos_b = clamped(tq_cos_(opposite)), sin_b = clamped(tq_sin_(opposite));
  const uint8_t *pixels = static_cast<const uint8_t *>(canvas);
  for (int64_t r = 0; r < g.height; ++r) {
    for (int64_t k = 0; k < g.width; ++k) {
      const int32_t expected = model_pixel(kind, src.data(), h, w, g, cos_b, sin_b, k, r);
      const uint8_t got = pixels[r * g.width + k];
      KEL_CHECK((kind == Kind::kUnsigned ? int32_t{got} : int32_t{static_cast<int8_t>(got)}) ==
                expected);
    }
  }
  // The whole block is the caller's: ASan reports it if the allocation was short.
  std::memset(canvas, 0x77, static_cast<size_t>(g.height * g.width));
  std::free(canvas);
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size) {
  Reader in(data, size);
  fuzz_one(in);
  return 0;
}
