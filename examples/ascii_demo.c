/* Draws a few figures into a small raster, rotates a picture, and prints both as ASCII art.
 * A first look at the library from C: plain rasters in, plain rasters out. */
#include <stdio.h>
#include <stdlib.h>
#include <string.h>

#include "kel_images.h"

enum { kHeight = 24, kWidth = 64 };

static char shade(uint8_t value) {
  static const char ramp[] = " .:-=+*#%@";
  return ramp[value * (sizeof ramp - 2) / 255];
}

static void print_raster(const char *title, const uint8_t *pixels, int32_t height, int32_t width) {
  int32_t y, x;
  printf("%s (%ld x %ld)\n", title, (long)width, (long)height);
  for (y = 0; y < height; ++y) {
    for (x = 0; x < width; ++x) putchar(shade(pixels[y * width + x]));
    putchar('\n');
  }
  putchar('\n');
}

static void draw_figures(void) {
  uint8_t raster[kHeight * kWidth];
  memset(raster, 0, sizeof raster);
  kel_image_draw_rectangle(raster, kHeight, kWidth, 1, 1, 62, 22, 128);
  kel_image_draw_line(raster, kHeight, kWidth, 3, 3, 21, 10, 255);
  kel_image_draw_triangle(raster, kHeight, kWidth, 29, 20, 35, 4, 42, 18, 200);
  kel_image_draw_circle(raster, kHeight, kWidth, 15, 52, 11, 255);
  /* The number's background box is the complement of its colour: 0 on 255 here. */
  kel_image_draw_number(raster, kHeight, kWidth, -2026, 1, 4, 14, 255);
  /* Figures are clipped pixel by pixel: this circle is mostly outside and costs nothing. */
  kel_image_draw_circle(raster, kHeight, kWidth, 4000000000u, 0, 0, 255);
  print_raster("Figures", raster, kHeight, kWidth);
}

static void rotate_picture(void) {
  enum { kSide = 14 };
  uint8_t source[kSide * kSide];
  uint8_t *canvas = NULL;
  int32_t canvas_height, canvas_width, offset_y, offset_x;
  memset(source, 40, sizeof source);
  kel_image_draw_rectangle(source, kSide, kSide, 0, 0, kSide, kSide, 255);
  kel_image_draw_number(source, kSide, kSide, 7, 1, 4, 3, 255);
  print_raster("Source", source, kSide, kSide);
  /* 32 units of 256 is an eighth of a turn, clockwise; uncovered canvas pixels hold 255. */
  kel_image_rotate(source, kSide, kSide, 32, &canvas, &canvas_height, &canvas_width, &offset_y,
                   &offset_x);
  if (canvas == NULL) {
    fprintf(stderr, "rotation: no memory for the canvas\n");
    return;
  }
  /* Show uncovered pixels as blank, so that the turned picture stands out. */
  {
    int32_t i;
    for (i = 0; i < canvas_height * canvas_width; ++i) {
      if (canvas[i] == 255) canvas[i] = 0;
    }
  }
  printf("Corner (0, 0) of the source lies at column %ld, row %ld of the canvas.\n", (long)offset_x,
         (long)offset_y);
  print_raster("Rotated by 32/256 of a turn", canvas, canvas_height, canvas_width);
  free(canvas);
}

int main(void) {
  draw_figures();
  rotate_picture();
  return 0;
}
