/* The smallest C host: draw, rotate, count. Exits 0 when the installed library answers. */
#include <stdlib.h>

#include "kel_images.h"

int main(void) {
  uint8_t raster[8 * 8] = {0};
  uint8_t *canvas = NULL;
  int32_t height, width, offset_y, offset_x;
  kel_image_draw_line(raster, 8, 8, 0, 0, 7, 7, 9);
  kel_image_rotate(raster, 8, 8, 64, &canvas, &height, &width, &offset_y, &offset_x);
  if (canvas == NULL || height != 9 || width != 9) return 1;
  free(canvas);
  return kel_image_std(raster, 8, 8, NULL) == 2 ? 0 : 1;
}
