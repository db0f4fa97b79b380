/* kel_images: routines on small greyscale images, integer and fixed point only.
 *
 * The library keeps no state, starts no threads and does no I/O. Every routine works on memory
 * the caller passes in; only kel_image_create_ex and the rotations hand out heap blocks, and
 * kel_mask_image takes scratch memory that it releases before it returns.
 *
 * A plain raster is a pointer to height x width one-byte pixels, row by row, with no bytes
 * between rows; pixel (x, y) lies at offset y * width + x. The drawing routines take the column
 * (x) before the row (y) and the colour last.
 *
 * Nothing is reported: routines return nothing or a computed value. Arguments outside a
 * routine's contract never cause undefined behaviour or a write outside the memory the call was
 * given; what they do instead is stated beside each routine.
 *
 * The library calls tq_cos_, tq_sin_, tq_sqrt_24_5, kel_blur_uint8 and
 * kel_scale_up_bilinear_uint8 outside itself; their declarations and contract are in
 * kel_outside.h, and the kel_images_outside library holds our defaults. */
#ifndef KEL_IMAGES_H
#define KEL_IMAGES_H

#include <stdint.h>

#define KEL_IMAGES_VERSION_MAJOR 0
#define KEL_IMAGES_VERSION_MINOR 1
#define KEL_IMAGES_VERSION_PATCH 0

#if defined(KEL_IMAGES_SHARED) && (defined(__GNUC__) || defined(__clang__))
#define KEL_API __attribute__((visibility("default")))
#else
#define KEL_API
#endif

#ifdef __cplusplus
extern "C" {
#endif

/* ---------------------------------------------------------------------------------------------
 * Image buffers
 * ------------------------------------------------------------------------------------------- */

/* A self-describing image: one heap block holds this record and, right behind it, the pixel
 * area of height * stride bytes. Pixel (row, col) begins at data + row * stride +
 * col * pixel_bytes. With pixel_bytes 1 and stride == width, data/height/width form a plain
 * raster. */
typedef struct kel_image {
  uint8_t *data;       /* first pixel byte; inside the same block, right after the record */
  int32_t height;      /* rows */
  int32_t width;       /* pixels per row */
  int32_t stride;      /* bytes from one row to the next, >= width * pixel_bytes */
  int32_t pixel_bytes; /* bytes per pixel */
} kel_image;

/* Allocates a record with an uninitialised pixel area of height * stride bytes. Returns null
 * when a size is negative, when stride < width * pixel_bytes, when width * pixel_bytes or
 * height * stride would leave the signed 32-bit range, or when malloc fails. The caller owns
 * the block and releases it with kel_image_delete. */
KEL_API kel_image *kel_image_create_ex(int32_t height, int32_t width, int32_t pixel_bytes,
                                       int32_t stride);

/* kel_image_create_ex with stride = width * pixel_bytes (rows packed without gaps). */
KEL_API kel_image *kel_image_create(int32_t height, int32_t width, int32_t pixel_bytes);

/* Releases a record made by the constructor; null is accepted and does nothing. */
KEL_API void kel_image_delete(kel_image *image);

/* Sets the whole pixel area (stride * height bytes, row padding included) to 0. */
KEL_API void kel_image_clear(kel_image *image);

/* data + row * stride + col * pixel_bytes. Indices are not checked; the caller keeps them
 * inside the image. The offset is formed in wrapping 32-bit arithmetic. */
KEL_API uint8_t *kel_image_ptr(const kel_image *image, int32_t row, int32_t col);

/* The byte offset row * stride + col * pixel_bytes from data, in wrapping 32-bit arithmetic. */
KEL_API int32_t kel_image_offset(const kel_image *image, int32_t row, int32_t col);

/* Writes rows[i] = buf + i * row_step for i = 0 .. height - 1; the caller supplies a table of
 * at least height entries. row_step is the plain raster's width or a record's stride. */
KEL_API void kel_images_1D_to_2D(uint8_t *buf, uint32_t height, int32_t row_step, uint8_t **rows);

/* Writes colour at buf[y * width + x] when y < height and x < width (unsigned comparisons, so a
 * negative position arrives as a large value and is skipped). Only the 16 bits of x count. */
KEL_API void kel_set_pixel(uint8_t *buf, uint32_t height, uint32_t width, uint32_t y, uint16_t x,
                           uint8_t colour);

/* ---------------------------------------------------------------------------------------------
 * Intensity statistics
 * ------------------------------------------------------------------------------------------- */

KEL_API void kel_image_histogram(const uint8_t *src, int32_t height, int32_t width, uint32_t *hist);
KEL_API void kel_image_histogram_n(const uint8_t *src, int32_t height, int32_t width, uint32_t bits,
                                   uint32_t *hist);
KEL_API uint8_t kel_hist_mean(const uint32_t *hist, uint32_t count);
KEL_API uint16_t kel_hist_var(const uint32_t *hist, uint8_t mean, uint32_t count);
KEL_API uint8_t kel_hist_std(const uint32_t *hist, uint8_t mean, uint32_t count);
KEL_API uint16_t kel_image_var(const uint8_t *src, int32_t height, int32_t width,
                               uint8_t *mean_out);
KEL_API uint8_t kel_image_std(const uint8_t *src, int32_t height, int32_t width, uint8_t *mean_out);

/* ---------------------------------------------------------------------------------------------
 * Rotation
 * ------------------------------------------------------------------------------------------- */

KEL_API void kel_image_rotate(const uint8_t *src, uint32_t height, uint32_t width, uint8_t angle,
                              uint8_t **canvas, int32_t *canvas_height, int32_t *canvas_width,
                              int32_t *offset_y, int32_t *offset_x);
KEL_API void kel_image_rotate_int8(const int8_t *src, uint32_t height, uint32_t width,
                                   uint8_t angle, int8_t **canvas, int32_t *canvas_height,
                                   int32_t *canvas_width, int32_t *offset_y, int32_t *offset_x);
KEL_API void kel_image_rotate_int8_nn(const int8_t *src, int32_t height, int32_t width,
                                      uint8_t angle, int8_t **canvas, int32_t *canvas_height,
                                      int32_t *canvas_width, int32_t *offset_y, int32_t *offset_x);

/* ---------------------------------------------------------------------------------------------
 * Pixel operations and compositing
 * ------------------------------------------------------------------------------------------- */

KEL_API void kel_image_brighten(const uint8_t *src, uint32_t height, uint32_t width,
                                uint32_t percent, uint8_t *dst);
KEL_API void kel_image_darken(const uint8_t *src, uint32_t height, uint32_t width, uint32_t percent,
                              uint8_t *dst);
KEL_API void kel_get_mask(const uint8_t *src, uint32_t height, uint32_t width, int32_t key,
                          uint8_t *mask);
KEL_API void kel_image_draw_image(uint8_t *dst, int32_t dst_height, int32_t dst_width,
                                  const uint8_t *src, uint16_t src_height, uint16_t src_width,
                                  int32_t x, int32_t y, uint16_t key);
KEL_API void kel_image_blend_image(uint8_t *dst, int32_t dst_height, int32_t dst_width,
                                   const uint8_t *src, uint16_t src_height, uint16_t src_width,
                                   int32_t x, int32_t y, uint16_t key);
KEL_API void kel_mask_image(const uint8_t *src, uint16_t height, uint16_t width,
                            const uint8_t *mask, uint8_t *dst);

/* ---------------------------------------------------------------------------------------------
 * Drawing. Every pixel of a figure is clipped on its own: it is written exactly when
 * 0 <= x < width and 0 <= y < height; a raster with height <= 0 or width <= 0 receives nothing.
 * Figures are computed from their own parameters, so one that crosses an edge puts the same
 * pixels inside the raster as on a larger raster. Any coordinates and sizes are safe, and the
 * work is proportional to what lands inside the raster.
 * ------------------------------------------------------------------------------------------- */

KEL_API void kel_image_draw_line(uint8_t *buf, int32_t height, int32_t width, int32_t x0,
                                 int32_t y0, int32_t x1, int32_t y1, uint8_t colour);
KEL_API void kel_image_draw_triangle(uint8_t *buf, int32_t height, int32_t width, int32_t x0,
                                     int32_t y0, int32_t x1, int32_t y1, int32_t x2, int32_t y2,
                                     uint8_t colour);
KEL_API void kel_image_draw_rectangle(uint8_t *buf, int32_t height, int32_t width, int32_t x,
                                      int32_t y, uint32_t rect_width, uint32_t rect_height,
                                      uint8_t colour);
KEL_API void kel_image_draw_number(uint8_t *buf, int32_t height, int32_t width, int32_t value,
                                   uint8_t min_digits, int32_t x, int32_t y, uint8_t colour);
KEL_API void kel_image_draw_circle(uint8_t *buf, int32_t height, int32_t width, uint32_t diameter,
                                   int32_t x, int32_t y, uint8_t colour);

#ifdef __cplusplus
} /* extern "C" */
#endif

#endif /* KEL_IMAGES_H */
