// Rotation of a raster about its corner (0, 0) onto a new canvas just large enough for the turned
// rectangle: one canvas geometry, one inverse mapping, three resampling policies.
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <cstring>

#include "kel_images.h"
#include "kernels.h"
#include "outside/kel_outside.h"
#include "wide_division.h"

namespace {

// Cosines, sines and source positions carry 14 fraction bits.
constexpr int64_t kOne = 16384;
constexpr int kFractionBits = 14;
constexpr int64_t kFractionMask = kOne - 1;

// A conforming math library stays inside [-1, 1]; clamping keeps a broken one from pushing the
// products below out of range.
int32_t clamped_trig(int32_t value) {
  constexpr int32_t one = static_cast<int32_t>(kOne);
  return value < -one ? -one : (value > one ? one : value);
}

// Cosine and sine fit 32 bits; the products with positions and sides are taken in 64.
struct Turn {
  int32_t cos, sin;
};

// The order of these two calls is part of the routine's observable behaviour.
Turn turn_by(uint8_t angle) {
  const int32_t cos = clamped_trig(tq_cos_(angle));
  const int32_t sin = clamped_trig(tq_sin_(angle));
  return {cos, sin};
}

// The canvas that holds the turned corners (0, 0), (W, 0), (0, H) and (W, H), plus one row and
// one column. Worked in 64 bits: for sides below 16384 nothing here comes near 32 bits, so this
// equals the 32-bit arithmetic; above that it is still the true rotation instead of a wrapped one.
struct CanvasGeometry {
  int64_t height, width, offset_y, offset_x;
};

CanvasGeometry turned_canvas(int64_t height, int64_t width, Turn a) {
  // The corner (0, 0) stays put; the other three turn. C++ division truncates toward zero, so a
  // negative extent shrinks toward 0 like a positive one.
  const int64_t corners[3][2] = {{width, 0}, {0, height}, {width, height}};
  int64_t x_min = 0, x_max = 0, y_min = 0, y_max = 0;
  for (const auto &corner : corners) {
    const int64_t x = (int64_t{a.cos} * corner[0] - int64_t{a.sin} * corner[1]) / kOne;
    const int64_t y = (int64_t{a.sin} * corner[0] + int64_t{a.cos} * corner[1]) / kOne;
    x_min = x < x_min ? x : x_min;
    x_max = x > x_max ? x : x_max;
    y_min = y < y_min ? y : y_min;
    y_max = y > y_max ? y : y_max;
  }
  return {y_max - y_min + 1, x_max - x_min + 1, -y_min, -x_min};
}

// Sides that the int32_t outputs can carry and a byte count that malloc can be asked for.
bool representable(const CanvasGeometry &g) {
  if (g.height > INT32_MAX || g.width > INT32_MAX) return false;
  const uint64_t bytes = static_cast<uint64_t>(g.height) * static_cast<uint64_t>(g.width);
  return bytes <= SIZE_MAX;
}

// Floor and ceiling of a / b for 0 < b, from the quotient and remainder of |a| / b
// (C++ division alone truncates toward zero).
kel::WideQuotient divide_magnitude(int64_t a, int32_t b) {
  const uint64_t magnitude = a < 0 ? 0 - static_cast<uint64_t>(a) : static_cast<uint64_t>(a);
  return kel::divide_wide(magnitude, static_cast<uint32_t>(b));
}

int64_t floor_div(int64_t a, int32_t b) {
  const kel::WideQuotient q = divide_magnitude(a, b);
  const auto whole = static_cast<int64_t>(q.quotient);
  return a < 0 ? -whole - (q.remainder != 0 ? 1 : 0) : whole;
}

int64_t ceil_div(int64_t a, int32_t b) {
  const kel::WideQuotient q = divide_magnitude(a, b);
  const auto whole = static_cast<int64_t>(q.quotient);
  return a < 0 ? -whole : whole + (q.remainder != 0 ? 1 : 0);
}

// Half-open column range [first, last) of a canvas row.
struct Span {
  int64_t first, last;
};

// The columns k of [0, columns) whose position slope * k + start lies in [0, high). The
// position is linear in k, so they form one run.
Span columns_inside(int32_t slope, int64_t start, int64_t high, int64_t columns) {
  Span span{0, columns};
  if (high <= 0) return {0, 0};
  if (slope == 0) return (0 <= start && start < high) ? span : Span{0, 0};
  if (slope > 0) {
    span.first = ceil_div(-start, slope);
    span.last = floor_div(high - 1 - start, slope) + 1;
  } else {
    span.first = ceil_div(start - (high - 1), -slope);
    span.last = floor_div(start, -slope) + 1;
  }
  if (span.first < 0) span.first = 0;
  if (span.last > columns) span.last = columns;
  return span;
}

// A source raster as the resampling policies read it. Positions handed to read() always lie
// inside, so the index never leaves the caller's height * width pixels.
template <typename Pixel>
struct Source {
  const Pixel *pixels;
  int64_t height, width;
  int32_t at(int64_t x, int64_t y) const {
    return pixels[static_cast<size_t>(y) * static_cast<size_t>(width) + static_cast<size_t>(x)];
  }
};

// Bilinear weights of the four neighbours: the sum is 2^28 times a weighted mean of them, in 64
// bits because it reaches 255 * 2^28.
template <typename Pixel>
int64_t bilinear_total(const Source<Pixel> &src, int64_t x0, int64_t y0, int32_t fx, int32_t fy) {
  const int32_t ax = static_cast<int32_t>(kOne) - fx;
  const int32_t ay = static_cast<int32_t>(kOne) - fy;
  const int32_t top = ax * src.at(x0, y0) + fx * src.at(x0 + 1, y0);
  const int32_t bottom = ax * src.at(x0, y0 + 1) + fx * src.at(x0 + 1, y0 + 1);
  return int64_t{ay} * top + int64_t{fy} * bottom;
}

// The three resamplings. kReach is how many columns (and rows) past the position's whole part
// are read: a position is resampled only when its whole part lies in [0, side - kReach). kRun is
// the kernel that resamples a run of a canvas row.
struct UnsignedBilinear {
  using Pixel = uint8_t;
  static constexpr kel::RotationRow<Pixel> kel::Kernels::*kRun = &kel::Kernels::rotate_u8;
  static constexpr uint8_t kFill = 255;
  static constexpr int64_t kReach = 1;
  static uint8_t resample(const Source<uint8_t> &src, int64_t x0, int64_t y0, int32_t fx,
                          int32_t fy) {
    // Never negative, so the shift is the truncating division by 2^28.
    return static_cast<uint8_t>(bilinear_total(src, x0, y0, fx, fy) >> 28);
  }
};

struct SignedBilinear {
  using Pixel = int8_t;
  static constexpr kel::RotationRow<Pixel> kel::Kernels::*kRun = &kel::Kernels::rotate_i8;
  static constexpr int8_t kFill = 0;
  static constexpr int64_t kReach = 1;
  static int8_t resample(const Source<int8_t> &src, int64_t x0, int64_t y0, int32_t fx,
                         int32_t fy) {
    const int64_t total = bilinear_total(src, x0, y0, fx, fy);
    // Truncate toward zero: -0.5 becomes 0, not -1 as a plain arithmetic shift would give.
    const int64_t toward_zero = total < 0 ? total + ((int64_t{1} << 28) - 1) : total;
    return static_cast<int8_t>(toward_zero >> 28);
  }
};

struct SignedNearest {
  using Pixel = int8_t;
  static constexpr kel::RotationRow<Pixel> kel::Kernels::*kRun = &kel::Kernels::rotate_i8_nn;
  static constexpr int8_t kFill = -128;
  static constexpr int64_t kReach = 0;
  static int8_t resample(const Source<int8_t> &src, int64_t x, int64_t y, int32_t, int32_t) {
    // -128 marks the canvas pixels the source does not cover, so a covered -128 becomes -127.
    const int32_t value = src.at(x, y);
    return static_cast<int8_t>(value == -128 ? -127 : value);
  }
};

// The columns [first, last) of canvas row r whose position, mapped back through the opposite
// turn b, has a whole part in [0, side - reach) on both axes, and the position of column first.
// The position is linear along a row, so they form one run, stepped through by (cos, sin).
struct RowRun {
  int64_t first, last, x, y;
};

RowRun row_run(const CanvasGeometry &g, Turn b, int64_t r, int64_t x_high, int64_t y_high) {
  const int64_t dy = r - g.offset_y;
  // Source position of canvas column 0 of this row.
  const int64_t sx0 = -int64_t{b.cos} * g.offset_x - int64_t{b.sin} * dy;
  const int64_t sy0 = -int64_t{b.sin} * g.offset_x + int64_t{b.cos} * dy;
  const Span in_x = columns_inside(b.cos, sx0, x_high, g.width);
  const Span in_y = columns_inside(b.sin, sy0, y_high, g.width);
  const int64_t first = in_x.first > in_y.first ? in_x.first : in_y.first;
  const int64_t last = in_x.last < in_y.last ? in_x.last : in_y.last;
  return {first, last, sx0 + int64_t{b.cos} * first, sy0 + int64_t{b.sin} * first};
}

// A run of a canvas row, resampled pixel by pixel. Stepping is exact integer algebra, so the
// positions equal those computed afresh.
template <typename Policy>
size_t resample_run(const kel::RotationRun &run, typename Policy::Pixel *out) {
  using Pixel = typename Policy::Pixel;
  const Source<Pixel> src{static_cast<const Pixel *>(run.src), run.height, run.width};
  int64_t x = run.x, y = run.y;
  for (size_t i = 0; i < run.count; ++i, x += run.step_x, y += run.step_y) {
    out[i] = Policy::resample(src, x >> kFractionBits, y >> kFractionBits,
                              static_cast<int32_t>(x & kFractionMask),
                              static_cast<int32_t>(y & kFractionMask));
  }
  return run.count;
}

// What the canvas walk needs of a resampling, without its pixel type: one walk, one fill and one
// allocation then serve all three rotations.
struct Resampling {
  uint8_t fill;   // the fill's byte
  int64_t reach;  // Policy::kReach
  // Resamples a run: the chosen kernel first, the plain body finishing it.
  void (*run)(kel::RotationRun run, void *out);
};

// The table is asked for each run rather than passed in, so that where it is known when
// compiling the kernels are called directly.
template <typename Policy>
void run_on(kel::RotationRun run, void *out) {
  auto *pixels = static_cast<typename Policy::Pixel *>(out);
  const size_t done = (kel::kernels().*Policy::kRun)(run, pixels);
  if (done >= run.count) return;
  run.x += int64_t{run.step_x} * static_cast<int64_t>(done);
  run.y += int64_t{run.step_y} * static_cast<int64_t>(done);
  run.count -= done;
  (kel::kPlainKernels.*Policy::kRun)(run, pixels + done);
}

template <typename Policy>
constexpr Resampling kResampling{static_cast<uint8_t>(Policy::kFill), Policy::kReach,
                                 run_on<Policy>};

// Maps every canvas pixel back through the opposite turn and resamples the source there. Each
// row visits only its run of columns inside the source, on the chosen table; pixels outside keep
// the fill.
void resample_canvas(const Resampling &how, const void *src, int64_t height, int64_t width,
                     const CanvasGeometry &g, Turn b, uint8_t *canvas) {
  // A whole part in [0, side - reach) is a fixed-point position in [0, (side - reach) * 16384).
  const int64_t x_high = (width - how.reach) * kOne;
  const int64_t y_high = (height - how.reach) * kOne;
  for (int64_t r = 0; r < g.height; ++r) {
    const RowRun columns = row_run(g, b, r, x_high, y_high);
    if (columns.first >= columns.last) continue;
    uint8_t *out = canvas + static_cast<size_t>(r) * static_cast<size_t>(g.width) +
                   static_cast<size_t>(columns.first);
    how.run({src, height, width, columns.x, columns.y, b.cos, b.sin,
             static_cast<size_t>(columns.last - columns.first)},
            out);
  }
}

// The canvas geometry that a turn by angle asks for, and its byte count; 0 bytes when its sides do
// not fit int32_t or its byte count does not fit size_t (sides are never below 1).
size_t canvas_for(int64_t height, int64_t width, uint8_t angle, kel_canvas &canvas) {
  const CanvasGeometry g = turned_canvas(height, width, turn_by(angle));
  if (!representable(g)) {
    canvas = kel_canvas{0, 0, 0, 0};
    return 0;
  }
  canvas = kel_canvas{static_cast<int32_t>(g.height), static_cast<int32_t>(g.width),
                      static_cast<int32_t>(g.offset_y), static_cast<int32_t>(g.offset_x)};
  return static_cast<size_t>(g.height) * static_cast<size_t>(g.width);
}

// Fills and resamples a canvas the caller holds. Any geometry is safe: positions are worked in
// 64 bits and only those inside the source are read; a buffer smaller than the geometry's sides
// (or no geometry) leaves everything untouched and asks the math library for nothing.
void rotate_into(const Resampling &how, const void *src, int64_t height, int64_t width,
                 uint8_t angle, const kel_canvas *canvas, void *out, size_t capacity) {
  if (canvas == nullptr || out == nullptr || canvas->height <= 0 || canvas->width <= 0) return;
  const CanvasGeometry g{canvas->height, canvas->width, canvas->offset_y, canvas->offset_x};
  if (static_cast<uint64_t>(g.height) * static_cast<uint64_t>(g.width) > capacity) return;
  std::memset(out, how.fill, static_cast<size_t>(g.height) * static_cast<size_t>(g.width));
  const Turn opposite = turn_by(static_cast<uint8_t>(-angle & 255));
  resample_canvas(how, src, height, width, g, opposite, static_cast<uint8_t *>(out));
}

// The heap-using rotation: the geometry, a canvas from malloc, then the rotation into it; returns
// the canvas. The four sizes and offsets are written before any pixel is resampled; when no
// canvas can be made they are 0 and the opposite turn is not asked for.
void *rotate(const Resampling &how, const void *src, int64_t height, int64_t width, uint8_t angle,
             int32_t *canvas_height, int32_t *canvas_width, int32_t *offset_y, int32_t *offset_x) {
  kel_canvas geometry;
  const size_t bytes = canvas_for(height, width, angle, geometry);
  *canvas_height = geometry.height;
  *canvas_width = geometry.width;
  *offset_y = geometry.offset_y;
  *offset_x = geometry.offset_x;
  if (bytes == 0) return nullptr;
  // Taken back through a volatile so that no compiler merges this malloc and the fill into
  // calloc: the header promises malloc, and hosts that count on it may provide no calloc.
  void *volatile fresh = std::malloc(bytes);
  void *block = fresh;
  if (block != nullptr) rotate_into(how, src, height, width, angle, &geometry, block, bytes);
  return block;
}

}  // namespace

namespace kel {
namespace plain {

size_t rotate_u8(const RotationRun &run, uint8_t *out) {
  return resample_run<UnsignedBilinear>(run, out);
}

size_t rotate_i8(const RotationRun &run, int8_t *out) {
  return resample_run<SignedBilinear>(run, out);
}

size_t rotate_i8_nn(const RotationRun &run, int8_t *out) {
  return resample_run<SignedNearest>(run, out);
}

}  // namespace plain
}  // namespace kel

extern "C" {

size_t kel_rotation_canvas(int64_t height, int64_t width, uint8_t angle, kel_canvas *canvas) {
  kel_canvas ignored;
  return canvas_for(height, width, angle, canvas != nullptr ? *canvas : ignored);
}

void kel_image_rotate_into(const uint8_t *src, uint32_t height, uint32_t width, uint8_t angle,
                           const kel_canvas *canvas, uint8_t *pixels, size_t capacity) {
  rotate_into(kResampling<UnsignedBilinear>, src, height, width, angle, canvas, pixels, capacity);
}

void kel_image_rotate_int8_into(const int8_t *src, uint32_t height, uint32_t width, uint8_t angle,
                                const kel_canvas *canvas, int8_t *pixels, size_t capacity) {
  rotate_into(kResampling<SignedBilinear>, src, height, width, angle, canvas, pixels, capacity);
}

void kel_image_rotate_int8_nn_into(const int8_t *src, int32_t height, int32_t width, uint8_t angle,
                                   const kel_canvas *canvas, int8_t *pixels, size_t capacity) {
  rotate_into(kResampling<SignedNearest>, src, height, width, angle, canvas, pixels, capacity);
}

void kel_image_rotate(const uint8_t *src, uint32_t height, uint32_t width, uint8_t angle,
                      uint8_t **canvas, int32_t *canvas_height, int32_t *canvas_width,
                      int32_t *offset_y, int32_t *offset_x) {
  *canvas = static_cast<uint8_t *>(rotate(kResampling<UnsignedBilinear>, src, height, width, angle,
                                          canvas_height, canvas_width, offset_y, offset_x));
}

void kel_image_rotate_int8(const int8_t *src, uint32_t height, uint32_t width, uint8_t angle,
                           int8_t **canvas, int32_t *canvas_height, int32_t *canvas_width,
                           int32_t *offset_y, int32_t *offset_x) {
  *canvas = static_cast<int8_t *>(rotate(kResampling<SignedBilinear>, src, height, width, angle,
                                         canvas_height, canvas_width, offset_y, offset_x));
}

void kel_image_rotate_int8_nn(const int8_t *src, int32_t height, int32_t width, uint8_t angle,
                              int8_t **canvas, int32_t *canvas_height, int32_t *canvas_width,
                              int32_t *offset_y, int32_t *offset_x) {
  *canvas = static_cast<int8_t *>(rotate(kResampling<SignedNearest>, src, height, width, angle,
                                         canvas_height, canvas_width, offset_y, offset_x));
}

}  // extern "C"
