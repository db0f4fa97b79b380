// The kel_images Python module: each routine of the C library over 2-D numpy arrays.
//
// Every argument is checked against the C routine's types before the call, so that a Python
// caller gets a TypeError or ValueError where a C caller would get a silent wrap. Pictures are
// read in place (no copy), and the GIL is released while the C routine runs, so that threads
// calling the module use several cores.
#include <pybind11/numpy.h>
#include <pybind11/pybind11.h>

#include <cstdint>
#include <cstdlib>
#include <limits>
#include <string>
#include <type_traits>
#include <utility>

#include "kel_images.h"

namespace py = pybind11;

// Any object passed where a picture or histogram belongs. It is taken as it is, so that the
// module, not pybind11's overload matching, says what is wrong with it; its signatures name the
// numpy array it must be.
struct ArrayArgument {
  py::handle object;
  operator py::handle() const { return object; }
};

namespace pybind11::detail {
template <>
struct type_caster<ArrayArgument> {
  PYBIND11_TYPE_CASTER(ArrayArgument, const_name("numpy.ndarray"));
  bool load(handle source, bool) {
    value.object = source;
    return true;
  }
};
}  // namespace pybind11::detail

namespace {

// A checked view of a numpy picture: its first pixel and its sides, as numpy gives them.
template <typename Pixel>
struct Picture {
  py::array array;  // keeps the pixels alive while the GIL is released
  Pixel *pixels;
  int64_t height, width;
};

template <typename Pixel>
const char *dtype_name() {
  return std::is_signed<Pixel>::value ? "int8" : "uint8";
}

[[noreturn]] void type_error(const std::string &message) {
  throw py::type_error(message);
}
[[noreturn]] void value_error(const std::string &message) {
  throw py::value_error(message);
}

// The array behind name, or a TypeError naming what it is instead.
template <typename Element>
py::array array_of(const py::handle &object, const char *name, const char *element_name) {
  if (!py::isinstance<py::array>(object)) {
    type_error(std::string(name) + " must be a numpy array, not " +
               std::string(py::str(py::type::handle_of(object).attr("__name__"))));
  }
  auto array = py::reinterpret_borrow<py::array>(object);
  if (!py::isinstance<py::array_t<Element>>(array)) {
    type_error(std::string(name) + " must have dtype " + element_name + ", not " +
               std::string(py::str(array.dtype())));
  }
  if (!(array.flags() & py::array::c_style)) {
    value_error(std::string(name) + " must be C-contiguous (numpy.ascontiguousarray makes it so)");
  }
  return array;
}

void require_writable(const py::array &array, const char *name) {
  if (!array.writeable()) value_error(std::string(name) + " is read-only");
}

// A 2-D, C-contiguous picture of Pixel, read where it lies.
template <typename Pixel>
Picture<Pixel> picture(const py::handle &object, const char *name) {
  py::array array = array_of<std::remove_const_t<Pixel>>(object, name, dtype_name<Pixel>());
  if (array.ndim() != 2) {
    value_error(std::string(name) + " must be 2-D, not " + std::to_string(array.ndim()) + "-D");
  }
  auto *pixels = static_cast<Pixel *>(const_cast<void *>(array.data()));
  return {array, pixels, array.shape(0), array.shape(1)};
}

template <typename Pixel>
Picture<Pixel> writable_picture(const py::handle &object, const char *name) {
  Picture<Pixel> result = picture<Pixel>(object, name);
  require_writable(result.array, name);
  return result;
}

// value as the C argument type Target, or a ValueError naming the range it must lie in.
template <typename Target>
Target narrow(int64_t value, const char *name) {
  constexpr auto low = static_cast<int64_t>(std::numeric_limits<Target>::min());
  constexpr auto high = static_cast<int64_t>(std::numeric_limits<Target>::max());
  if (value < low || value > high) {
    value_error(std::string(name) + " must be in " + std::to_string(low) + ".." +
                std::to_string(high) + ", not " + std::to_string(value));
  }
  return static_cast<Target>(value);
}

// The C routines take their sides in 32 or 16 bits and some form height * width in 32 bits;
// a picture too large for that is refused rather than wrapped.
template <typename Side, typename Pixel>
std::pair<Side, Side> sides(const Picture<Pixel> &picture, const char *name,
                            uint64_t max_pixels = std::numeric_limits<uint64_t>::max()) {
  constexpr auto max_side = static_cast<int64_t>(std::numeric_limits<Side>::max());
  if (picture.height > max_side || picture.width > max_side ||
      static_cast<uint64_t>(picture.height) * static_cast<uint64_t>(picture.width) > max_pixels) {
    value_error(std::string(name) + " of " + std::to_string(picture.height) + " x " +
                std::to_string(picture.width) + " is too large for this routine");
  }
  return {static_cast<Side>(picture.height), static_cast<Side>(picture.width)};
}

// The statistics read height * width pixels as a signed 32-bit count.
constexpr uint64_t kMaxCountedPixels = std::numeric_limits<int32_t>::max();
// The point operations form height * width in unsigned 32 bits.
constexpr uint64_t kMaxPointPixels = std::numeric_limits<uint32_t>::max();
// The masked fill's enlarged sides must stay within 16 bits.
constexpr int64_t kMaxFillSide = 65528;

template <typename Pixel>
py::array_t<Pixel> new_picture(int64_t height, int64_t width) {
  return py::array_t<Pixel>({height, width});
}

// A histogram argument: 1-D uint32 with exactly 256 bins.
const uint32_t *histogram_bins(const py::handle &object) {
  py::array array = array_of<uint32_t>(object, "hist", "uint32");
  if (array.ndim() != 1 || array.shape(0) != 256) {
    value_error("hist must hold 256 bins, not shape " +
                std::string(py::str(py::tuple(array.attr("shape")))));
  }
  return static_cast<const uint32_t *>(array.data());
}

py::array_t<uint32_t> histogram(ArrayArgument img) {
  auto source = picture<const uint8_t>(img, "img");
  auto [height, width] = sides<int32_t>(source, "img", kMaxCountedPixels);
  py::array_t<uint32_t> hist(256);
  uint32_t *bins = hist.mutable_data();
  py::gil_scoped_release unlocked;
  kel_image_histogram(source.pixels, height, width, bins);
  return hist;
}

py::array_t<uint32_t> histogram_n(ArrayArgument img, int64_t bits) {
  auto source = picture<const uint8_t>(img, "img");
  auto [height, width] = sides<int32_t>(source, "img", kMaxCountedPixels);
  // Above 8 the C routine counts 256 bins but the array would promise 2**bits.
  if (bits < 0 || bits > 8) value_error("bits must be in 0..8, not " + std::to_string(bits));
  py::array_t<uint32_t> hist(int64_t{1} << bits);
  uint32_t *bins = hist.mutable_data();
  py::gil_scoped_release unlocked;
  kel_image_histogram_n(source.pixels, height, width, static_cast<uint32_t>(bits), bins);
  return hist;
}

int hist_mean(ArrayArgument hist, int64_t count) {
  const uint32_t *bins = histogram_bins(hist);
  const uint32_t n = narrow<uint32_t>(count, "count");
  py::gil_scoped_release unlocked;
  return kel_hist_mean(bins, n);
}

int hist_var(ArrayArgument hist, int64_t mean, int64_t count) {
  const uint32_t *bins = histogram_bins(hist);
  const uint8_t m = narrow<uint8_t>(mean, "mean");
  const uint32_t n = narrow<uint32_t>(count, "count");
  py::gil_scoped_release unlocked;
  return kel_hist_var(bins, m, n);
}

int hist_std(ArrayArgument hist, int64_t mean, int64_t count) {
  const uint32_t *bins = histogram_bins(hist);
  const uint8_t m = narrow<uint8_t>(mean, "mean");
  const uint32_t n = narrow<uint32_t>(count, "count");
  py::gil_scoped_release unlocked;
  return kel_hist_std(bins, m, n);
}

// var and std: the statistic and the truncated mean that the routine stores beside it.
template <typename Statistic>
py::tuple image_statistic(ArrayArgument img,
                          Statistic (*routine)(const uint8_t *, int32_t, int32_t, uint8_t *)) {
  auto source = picture<const uint8_t>(img, "img");
  auto [height, width] = sides<int32_t>(source, "img", kMaxCountedPixels);
  uint8_t mean = 0;
  Statistic value = 0;
  {
    py::gil_scoped_release unlocked;
    value = routine(source.pixels, height, width, &mean);
  }
  return py::make_tuple(value, mean);
}

py::tuple var(ArrayArgument img) {
  return image_statistic(img, kel_image_var);
}
py::tuple std_dev(ArrayArgument img) {
  return image_statistic(img, kel_image_std);
}

// The canvas and the corner's place on it, the canvas handed to numpy with free as its release.
struct Rotated {
  void *canvas = nullptr;
  int32_t height = 0, width = 0, offset_y = 0, offset_x = 0;
};

template <typename Pixel>
py::tuple canvas_result(const Rotated &rotated) {
  if (rotated.canvas == nullptr) {
    PyErr_SetString(PyExc_MemoryError, "no memory for the rotated canvas");
    throw py::error_already_set();
  }
  py::capsule owner(rotated.canvas, [](void *block) { std::free(block); });
  py::array_t<Pixel> canvas({int64_t{rotated.height}, int64_t{rotated.width}},
                            static_cast<Pixel *>(rotated.canvas), owner);
  return py::make_tuple(canvas, py::make_tuple(rotated.offset_y, rotated.offset_x));
}

py::tuple rotate(ArrayArgument img, int64_t angle_value, bool nearest) {
  const uint8_t angle = narrow<uint8_t>(angle_value, "angle");
  Rotated out;
  if (py::isinstance<py::array_t<int8_t>>(img)) {
    auto source = picture<const int8_t>(img, "img");
    auto **canvas = reinterpret_cast<int8_t **>(&out.canvas);
    if (nearest) {
      auto [height, width] = sides<int32_t>(source, "img");
      py::gil_scoped_release unlocked;
      kel_image_rotate_int8_nn(source.pixels, height, width, angle, canvas, &out.height, &out.width,
                               &out.offset_y, &out.offset_x);
    } else {
      auto [height, width] = sides<uint32_t>(source, "img");
      py::gil_scoped_release unlocked;
      kel_image_rotate_int8(source.pixels, height, width, angle, canvas, &out.height, &out.width,
                            &out.offset_y, &out.offset_x);
    }
    return canvas_result<int8_t>(out);
  }
  if (py::isinstance<py::array>(img) && !py::isinstance<py::array_t<uint8_t>>(img)) {
    type_error("img must have dtype uint8 or int8, not " +
               std::string(py::str(py::reinterpret_borrow<py::array>(img).dtype())));
  }
  auto source = picture<const uint8_t>(img, "img");
  if (nearest) value_error("nearest=True rotates int8 pictures only");
  auto [height, width] = sides<uint32_t>(source, "img");
  {
    py::gil_scoped_release unlocked;
    kel_image_rotate(source.pixels, height, width, angle, reinterpret_cast<uint8_t **>(&out.canvas),
                     &out.height, &out.width, &out.offset_y, &out.offset_x);
  }
  return canvas_result<uint8_t>(out);
}

// brighten, darken and get_mask: a new picture from the old, given one number of the routine's
// type (the percentage, or the key).
template <typename Argument>
py::array_t<uint8_t> point_operation(void (*operation)(const uint8_t *, uint32_t, uint32_t,
                                                       Argument, uint8_t *),
                                     ArrayArgument img, int64_t value, const char *name) {
  auto source = picture<const uint8_t>(img, "img");
  auto [height, width] = sides<uint32_t>(source, "img", kMaxPointPixels);
  const Argument argument = narrow<Argument>(value, name);
  auto result = new_picture<uint8_t>(source.height, source.width);
  uint8_t *out = result.mutable_data();
  py::gil_scoped_release unlocked;
  operation(source.pixels, height, width, argument, out);
  return result;
}

py::array_t<uint8_t> brighten(ArrayArgument img, int64_t percent) {
  return point_operation(kel_image_brighten, img, percent, "percent");
}

py::array_t<uint8_t> darken(ArrayArgument img, int64_t percent) {
  return point_operation(kel_image_darken, img, percent, "percent");
}

py::array_t<uint8_t> get_mask(ArrayArgument img, int64_t key) {
  return point_operation(kel_get_mask, img, key, "key");
}

void require_same_shape(const Picture<const uint8_t> &a, const Picture<const uint8_t> &b,
                        const char *name) {
  if (a.height != b.height || a.width != b.width) {
    value_error(std::string(name) + " must have the picture's shape (" + std::to_string(a.height) +
                ", " + std::to_string(a.width) + "), not (" + std::to_string(b.height) + ", " +
                std::to_string(b.width) + ")");
  }
}

py::array_t<uint8_t> mask_image(ArrayArgument img, ArrayArgument mask) {
  auto source = picture<const uint8_t>(img, "img");
  auto holes = picture<const uint8_t>(mask, "mask");
  require_same_shape(source, holes, "mask");
  if (source.height > kMaxFillSide || source.width > kMaxFillSide) {
    value_error("mask_image takes sides up to " + std::to_string(kMaxFillSide));
  }
  // The fill works in place on a copy, so that a fill that finds no memory returns the picture
  // unchanged rather than an uninitialised one.
  py::array_t<uint8_t> result = py::array_t<uint8_t>(source.array.attr("copy")());
  uint8_t *out = result.mutable_data();
  const auto height = static_cast<uint16_t>(source.height);
  const auto width = static_cast<uint16_t>(source.width);
  py::gil_scoped_release unlocked;
  kel_mask_image(out, height, width, holes.pixels, out);
  return result;
}

using Composite = void (*)(uint8_t *, int32_t, int32_t, const uint8_t *, uint16_t, uint16_t,
                           int32_t, int32_t, uint16_t);

void composite(Composite operation, ArrayArgument dst, ArrayArgument src, int64_t x, int64_t y,
               int64_t key) {
  auto target = writable_picture<uint8_t>(dst, "dst");
  auto source = picture<const uint8_t>(src, "src");
  auto [dst_height, dst_width] = sides<int32_t>(target, "dst");
  auto [src_height, src_width] = sides<uint16_t>(source, "src");
  const int32_t x32 = narrow<int32_t>(x, "x");
  const int32_t y32 = narrow<int32_t>(y, "y");
  const uint16_t key16 = narrow<uint16_t>(key, "key");
  py::gil_scoped_release unlocked;
  operation(target.pixels, dst_height, dst_width, source.pixels, src_height, src_width, x32, y32,
            key16);
}

void draw_image(ArrayArgument dst, ArrayArgument src, int64_t x, int64_t y, int64_t key) {
  composite(kel_image_draw_image, dst, src, x, y, key);
}

void blend_image(ArrayArgument dst, ArrayArgument src, int64_t x, int64_t y, int64_t key) {
  composite(kel_image_blend_image, dst, src, x, y, key);
}

// The raster every figure is drawn into, with the sides the drawing routines take.
struct Canvas {
  uint8_t *pixels;
  int32_t height, width;
};

Canvas drawing_target(ArrayArgument img) {
  auto target = writable_picture<uint8_t>(img, "img");
  auto [height, width] = sides<int32_t>(target, "img");
  return {target.pixels, height, width};
}

void draw_line(ArrayArgument img, int64_t x0, int64_t y0, int64_t x1, int64_t y1, int64_t colour) {
  const Canvas canvas = drawing_target(img);
  const int32_t ends[] = {narrow<int32_t>(x0, "x0"), narrow<int32_t>(y0, "y0"),
                          narrow<int32_t>(x1, "x1"), narrow<int32_t>(y1, "y1")};
  const uint8_t c = narrow<uint8_t>(colour, "colour");
  py::gil_scoped_release unlocked;
  kel_image_draw_line(canvas.pixels, canvas.height, canvas.width, ends[0], ends[1], ends[2],
                      ends[3], c);
}

void draw_triangle(ArrayArgument img, int64_t x0, int64_t y0, int64_t x1, int64_t y1, int64_t x2,
                   int64_t y2, int64_t colour) {
  const Canvas canvas = drawing_target(img);
  const int32_t corners[] = {narrow<int32_t>(x0, "x0"), narrow<int32_t>(y0, "y0"),
                             narrow<int32_t>(x1, "x1"), narrow<int32_t>(y1, "y1"),
                             narrow<int32_t>(x2, "x2"), narrow<int32_t>(y2, "y2")};
  const uint8_t c = narrow<uint8_t>(colour, "colour");
  py::gil_scoped_release unlocked;
  kel_image_draw_triangle(canvas.pixels, canvas.height, canvas.width, corners[0], corners[1],
                          corners[2], corners[3], corners[4], corners[5], c);
}

void draw_rectangle(ArrayArgument img, int64_t x, int64_t y, int64_t width, int64_t height,
                    int64_t colour) {
  const Canvas canvas = drawing_target(img);
  const int32_t x32 = narrow<int32_t>(x, "x"), y32 = narrow<int32_t>(y, "y");
  const uint32_t w = narrow<uint32_t>(width, "width"), h = narrow<uint32_t>(height, "height");
  const uint8_t c = narrow<uint8_t>(colour, "colour");
  py::gil_scoped_release unlocked;
  kel_image_draw_rectangle(canvas.pixels, canvas.height, canvas.width, x32, y32, w, h, c);
}

void draw_number(ArrayArgument img, int64_t value, int64_t min_digits, int64_t x, int64_t y,
                 int64_t colour) {
  const Canvas canvas = drawing_target(img);
  const int32_t v = narrow<int32_t>(value, "value");
  const uint8_t digits = narrow<uint8_t>(min_digits, "min_digits");
  const int32_t x32 = narrow<int32_t>(x, "x"), y32 = narrow<int32_t>(y, "y");
  const uint8_t c = narrow<uint8_t>(colour, "colour");
  py::gil_scoped_release unlocked;
  kel_image_draw_number(canvas.pixels, canvas.height, canvas.width, v, digits, x32, y32, c);
}

void draw_circle(ArrayArgument img, int64_t diameter, int64_t x, int64_t y, int64_t colour) {
  const Canvas canvas = drawing_target(img);
  const uint32_t d = narrow<uint32_t>(diameter, "diameter");
  const int32_t x32 = narrow<int32_t>(x, "x"), y32 = narrow<int32_t>(y, "y");
  const uint8_t c = narrow<uint8_t>(colour, "colour");
  py::gil_scoped_release unlocked;
  kel_image_draw_circle(canvas.pixels, canvas.height, canvas.width, d, x32, y32, c);
}

void set_pixel(ArrayArgument img, int64_t y, int64_t x, int64_t colour) {
  auto target = writable_picture<uint8_t>(img, "img");
  auto [height, width] = sides<uint32_t>(target, "img");
  const uint32_t y32 = narrow<uint32_t>(y, "y");
  const uint16_t x16 = narrow<uint16_t>(x, "x");
  const uint8_t c = narrow<uint8_t>(colour, "colour");
  py::gil_scoped_release unlocked;
  kel_set_pixel(target.pixels, height, width, y32, x16, c);
}

}  // namespace

PYBIND11_MODULE(_kel_images, m) {
  m.doc() =
      "kel_images: integer, bit-exact routines on 2-D numpy arrays of uint8 (int8 for the "
      "signed rotations).";
  using py::arg;

  m.def("histogram", &histogram, arg("img"),
        "Counts the pixels of a uint8 picture into 256 bins; returns uint32[256].");
  m.def("histogram_n", &histogram_n, arg("img"), arg("bits"),
        "Counts each pixel into the bin of its top `bits` bits (0..8); returns uint32[2**bits].");
  m.def("hist_mean", &hist_mean, arg("hist"), arg("count"),
        "The mean of a 256-bin histogram of `count` pixels, truncated to its low 8 bits; 0 for "
        "count 0.");
  m.def("hist_var", &hist_var, arg("hist"), arg("mean"), arg("count"),
        "The population variance about `mean` (as hist_mean gives it), truncated to its low 16 "
        "bits; 0 for count 0.");
  m.def("hist_std", &hist_std, arg("hist"), arg("mean"), arg("count"),
        "floor(sqrt(hist_var(hist, mean, count))), in the library's fixed point.");
  m.def("var", &var, arg("img"),
        "The variance of a uint8 picture's intensities and their truncated mean: (var, mean).");
  m.def("std", &std_dev, arg("img"),
        "The standard deviation of a uint8 picture's intensities and their truncated mean: "
        "(std, mean).");
  m.def("rotate", &rotate, arg("img"), arg("angle"), arg("nearest") = false,
        "Turns a picture by angle * 2pi / 256 (angle 0..255) about its corner (0, 0) onto a new "
        "canvas just large enough; returns (canvas, (offset_y, offset_x)), the offsets being "
        "where the corner landed. uint8: bilinear, uncovered pixels 255. int8: bilinear with "
        "fill 0, or nearest neighbour with fill -128 when nearest=True (int8 only).");
  m.def("brighten", &brighten, arg("img"), arg("percent"),
        "A new picture with every pixel moved percent % of the way toward white (100 and more "
        "give all 255).");
  m.def("darken", &darken, arg("img"), arg("percent"),
        "A new picture with every pixel moved percent % of the way toward black (100 and more "
        "give all 0).");
  m.def("get_mask", &get_mask, arg("img"), arg("key"),
        "A new mask: 0 where the picture equals key, 1 elsewhere (a key outside 0..255 gives all "
        "1).");
  m.def("mask_image", &mask_image, arg("img"), arg("mask"),
        "A new picture whose hole (the pixels where mask is 0) is filled with a smooth surface "
        "made from the values along its edge; mask has the picture's shape.");
  m.def("draw_image", &draw_image, arg("dst"), arg("src"), arg("x"), arg("y"), arg("key") = 256,
        "Pastes src onto dst in place, its top-left pixel at column x, row y, clipped to dst; "
        "source pixels equal to key (0..255) are transparent, 256..65535 makes none so.");
  m.def("blend_image", &blend_image, arg("dst"), arg("src"), arg("x"), arg("y"), arg("key") = 256,
        "Like draw_image, but each covered dst pixel d becomes (d + s) >> 1.");
  m.def("draw_line", &draw_line, arg("img"), arg("x0"), arg("y0"), arg("x1"), arg("y1"),
        arg("colour"), "Draws the clipped one-pixel line from (x0, y0) to (x1, y1) in place.");
  m.def("draw_triangle", &draw_triangle, arg("img"), arg("x0"), arg("y0"), arg("x1"), arg("y1"),
        arg("x2"), arg("y2"), arg("colour"),
        "Draws a triangle's clipped outline in place, as three lines.");
  m.def("draw_rectangle", &draw_rectangle, arg("img"), arg("x"), arg("y"), arg("width"),
        arg("height"), arg("colour"),
        "Draws the clipped one-pixel outline of a width x height rectangle whose top-left pixel "
        "is (x, y), in place.");
  m.def("draw_number", &draw_number, arg("img"), arg("value"), arg("min_digits"), arg("x"),
        arg("y"), arg("colour"),
        "Writes value in decimal with the built-in 4 x 7 font, each digit on a box of "
        "255 - colour, leading zeros up to min_digits, from (x, y), in place.");
  m.def("draw_circle", &draw_circle, arg("img"), arg("diameter"), arg("x"), arg("y"), arg("colour"),
        "Draws the clipped outline of an octagonal circle of the given diameter around (x, y), "
        "in place.");
  m.def("set_pixel", &set_pixel, arg("img"), arg("y"), arg("x"), arg("colour"),
        "Writes colour at row y, column x when that lies inside the picture (row first).");
}
