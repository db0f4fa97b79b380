/* The smallest firmware CI links: it calls only kel_image_draw_line, so with the library's
 * sections and --gc-sections it carries the line drawing and nothing else of the library. */
#include <stdint.h>

#include "kel_images.h"

static uint8_t frame[48 * 64];

int main(void) {
  kel_image_draw_line(frame, 48, 64, -20, 3, 90, 44, 200);
  return frame[10 * 64 + 20];
}
