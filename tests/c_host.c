/* A host written in C: the public header must compile as C99 and the library must link. */
#include <stdio.h>
#include <stdlib.h>

#include "kel_images.h"

static int failures = 0;

static void check(int ok, const char *what) {
  if (!ok) {
    fprintf(stderr, "c_host: %s failed\n", what);
    ++failures;
  }
}

int main(void) {
  kel_image *image = kel_image_create(4, 6, 1);
  uint8_t *rows[4];
  check(image != NULL, "create");
  if (image == NULL) return 1;
  kel_image_clear(image);
  kel_images_1D_to_2D(image->data, 4, image->stride, rows);
  kel_set_pixel(image->data, 4, 6, 2, 3, 9);
  check(rows[2][3] == 9, "set_pixel through a row table");
  check(kel_image_offset(image, 2, 3) == 15, "offset");
  check(kel_image_ptr(image, 2, 3) == image->data + 15, "ptr");
  kel_image_delete(image);
  if (failures == 0) printf("c_host: 1 passed, 0 failed\n");
  return failures == 0 ? 0 : 1;
}
