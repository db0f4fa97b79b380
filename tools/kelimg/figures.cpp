#include "figures.h"

#include <algorithm>
#include <charconv>
#include <cstdlib>
#include <vector>

#include "kel_images.h"
#include "operations.h"

namespace kelimg {
namespace {

struct Range {
  int64_t low, high;
};

// The field's name says what it is.
Range field_range(const std::string &name) {
  if (name == "COLOUR") return {0, 255};
  if (name == "VALUE") return {-999999999, 999999999};
  if (name == "DIGITS") return {0, 255};
  if (name == "WIDTH" || name == "HEIGHT" || name == "DIAMETER") return {0, kCoordinateLimit};
  return {-kCoordinateLimit, kCoordinateLimit};
}

std::vector<std::string> split(const std::string &text) {
  std::vector<std::string> parts;
  size_t start = 0;
  for (size_t comma = text.find(','); comma != std::string::npos; comma = text.find(',', start)) {
    parts.push_back(text.substr(start, comma - start));
    start = comma + 1;
  }
  parts.push_back(text.substr(start));
  return parts;
}

Figure make(Shape shape, std::initializer_list<int32_t> fields) {
  Figure figure;
  figure.shape = shape;
  std::copy(fields.begin(), fields.end(), figure.fields.begin());
  return figure;
}

uint8_t colour_of(int32_t field) {
  return static_cast<uint8_t>(field);
}
uint32_t size_of(int32_t field) {
  return static_cast<uint32_t>(field);
}

}  // namespace

Figure parse_figure(const FigureKind &kind, const std::string &text) {
  // Brackets mark the optional fields at the end.
  std::string syntax;
  size_t optional = 0;
  for (const char c : std::string(kind.fields)) {
    if (c == '[') ++optional;
    if (c != '[' && c != ']') syntax += c;
  }
  const std::vector<std::string> names = split(syntax);
  const std::vector<std::string> values = split(text);
  const std::string context = std::string(kind.option) + " " + text + ": ";
  if (values.size() > names.size() || values.size() + optional < names.size()) {
    throw InputError(context + "expected " + kind.fields);
  }

  Figure figure;
  figure.shape = kind.shape;
  figure.fields[names.size() - 1] = 1;  // the optional DIGITS, when left out
  for (size_t i = 0; i < values.size(); ++i) {
    int64_t value = 0;
    const char *first = values[i].data();
    const char *last = first + values[i].size();
    if (first != last && *first == '+') ++first;
    const auto [end, error] = std::from_chars(first, last, value);
    if (first == last || error != std::errc() || end != last) {
      throw InputError(context + names[i] + " must be a whole number, not '" + values[i] + "'");
    }
    const Range range = field_range(names[i]);
    if (value < range.low || value > range.high) {
      throw InputError(context + names[i] + " must lie in " + std::to_string(range.low) + " to " +
                       std::to_string(range.high));
    }
    figure.fields[i] = static_cast<int32_t>(value);
  }
  return figure;
}

std::string format_figure(const Figure &figure) {
  const FigureKind *kind = kFigureKinds;
  while (kind->shape != figure.shape) ++kind;
  const std::string fields = kind->fields;
  size_t count = static_cast<size_t>(std::count(fields.begin(), fields.end(), ',')) + 1;
  if (figure.shape == Shape::number && figure.fields[count - 1] == 1) --count;
  std::string text = std::string(kind->option) + " ";
  for (size_t i = 0; i < count; ++i) text += (i == 0 ? "" : ",") + std::to_string(figure.fields[i]);
  return text;
}

void draw_figure(Picture &picture, const Figure &figure) {
  uint8_t *buf = picture.data();
  const int32_t height = picture.height, width = picture.width;
  const std::array<int32_t, 7> &f = figure.fields;
  switch (figure.shape) {
    case Shape::line:
      kel_image_draw_line(buf, height, width, f[0], f[1], f[2], f[3], colour_of(f[4]));
      break;
    case Shape::triangle:
      kel_image_draw_triangle(buf, height, width, f[0], f[1], f[2], f[3], f[4], f[5],
                              colour_of(f[6]));
      break;
    case Shape::rectangle:
      kel_image_draw_rectangle(buf, height, width, f[0], f[1], size_of(f[2]), size_of(f[3]),
                               colour_of(f[4]));
      break;
    case Shape::circle:
      kel_image_draw_circle(buf, height, width, size_of(f[2]), f[0], f[1], colour_of(f[3]));
      break;
    case Shape::number:
      kel_image_draw_number(buf, height, width, f[0], static_cast<uint8_t>(f[4]), f[1], f[2],
                            colour_of(f[3]));
      break;
  }
}

Figure line(int32_t x0, int32_t y0, int32_t x1, int32_t y1, uint8_t colour) {
  return make(Shape::line, {x0, y0, x1, y1, colour});
}

Figure triangle(int32_t x0, int32_t y0, int32_t x1, int32_t y1, int32_t x2, int32_t y2,
                uint8_t colour) {
  return make(Shape::triangle, {x0, y0, x1, y1, x2, y2, colour});
}

Figure rectangle(int32_t x, int32_t y, int32_t width, int32_t height, uint8_t colour) {
  return make(Shape::rectangle, {x, y, width, height, colour});
}

Figure circle(int32_t x, int32_t y, int32_t diameter, uint8_t colour) {
  return make(Shape::circle, {x, y, diameter, colour});
}

Figure number(int32_t value, int32_t x, int32_t y, uint8_t colour, int32_t min_digits) {
  return make(Shape::number, {value, x, y, colour, min_digits});
}

Figure centred_number(int32_t value, int32_t centre_x, int32_t y, uint8_t colour) {
  int32_t digits = 1;
  for (int32_t rest = std::abs(value) / 10; rest != 0; rest /= 10) ++digits;
  // Digits are five columns apart and four wide; a minus sign takes a step of its own.
  const int32_t text_width = 5 * digits - 1 + (value < 0 ? 5 : 0);
  return number(value, centre_x - text_width / 2, y, colour);
}

}  // namespace kelimg
