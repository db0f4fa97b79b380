// Figures as the command line writes them ("--line 0,0,31,9,255") and their drawing.
#ifndef KELIMG_FIGURES_H
#define KELIMG_FIGURES_H

#include <array>
#include <cstdint>
#include <string>

#include "picture.h"

namespace kelimg {

enum class Shape { line, triangle, rectangle, circle, number };

// How one kind of figure is written: its option and its comma-separated fields. The field names
// also decide each field's range (X.. and Y.. coordinates, WIDTH, HEIGHT and DIAMETER sizes,
// COLOUR 0 to 255, VALUE the numbers the font can show, DIGITS a count); a field in brackets
// may be left out.
struct FigureKind {
  Shape shape;
  const char *option;
  const char *fields;
  const char *description;
};

constexpr FigureKind kFigureKinds[] = {
    {Shape::line, "--line", "X0,Y0,X1,Y1,COLOUR", "a line between two end points, both included"},
    {Shape::triangle, "--triangle", "X0,Y0,X1,Y1,X2,Y2,COLOUR", "the outline of a triangle"},
    {Shape::rectangle, "--rect", "X,Y,WIDTH,HEIGHT,COLOUR",
     "the outline of a rectangle whose top-left pixel is X,Y"},
    {Shape::circle, "--circle", "X,Y,DIAMETER,COLOUR",
     "the outline of a circle around the pixel X,Y"},
    {Shape::number, "--number", "VALUE,X,Y,COLOUR[,DIGITS]",
     "a decimal number from -999999999 to 999999999 with its top-left glyph pixel at X,Y, "
     "on boxes of 255-COLOUR, with leading zeros up to DIGITS digits (default 1)"},
};

// The fields in the order the kind writes them; a number's optional DIGITS defaults to 1.
struct Figure {
  Shape shape = Shape::line;
  std::array<int32_t, 7> fields{};
};

// Parses the text given to kind.option; a wrong count or a field out of range is an InputError.
Figure parse_figure(const FigureKind &kind, const std::string &text);

// The option that parse_figure reads back as this figure, such as "--line 0,0,31,9,255".
std::string format_figure(const Figure &figure);

void draw_figure(Picture &picture, const Figure &figure);

Figure line(int32_t x0, int32_t y0, int32_t x1, int32_t y1, uint8_t colour);
Figure triangle(int32_t x0, int32_t y0, int32_t x1, int32_t y1, int32_t x2, int32_t y2,
                uint8_t colour);
Figure rectangle(int32_t x, int32_t y, int32_t width, int32_t height, uint8_t colour);
Figure circle(int32_t x, int32_t y, int32_t diameter, uint8_t colour);
Figure number(int32_t value, int32_t x, int32_t y, uint8_t colour, int32_t min_digits = 1);
// A number whose digits are centred on column centre_x.
Figure centred_number(int32_t value, int32_t centre_x, int32_t y, uint8_t colour);

}  // namespace kelimg

#endif  // KELIMG_FIGURES_H
