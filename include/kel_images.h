/* kel_images: routines on small greyscale images, integer and fixed point only.
 *
 * The library keeps no state, starts no threads and does no I/O. Every routine works on memory
 * the caller passes in; only kel_image_create_ex and the rotations hand out heap blocks, and
 * kel_mask_image takes scratch memory that it releases before it returns. The rotations and the
 * fill each have a heap-free twin (_into) that works in buffers the caller passes, with a call
 * that gives their sizes.
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
 * kel_outside.h, and the kel_images_outside library holds our defaults.
 *
 * Stack: built for a Cortex-M4 (-Os), no routine takes more than 1 KiB, what it calls and our
 * outside functions included: kel_mask_image under 900 bytes, the rotations, drawing, paste and
 * blend under 450, every other routine of this header under 60 (the C library's own aside). The
 * README's table gives each routine's figure, which CI checks. Builds with vector variants also
 * keep three extra 256-bin histograms (3 KiB) on the stack while counting. */
#ifndef KEL_IMAGES_H
#define KEL_IMAGES_H

#include <stddef.h>
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

/* Integer statistics of a plain raster's intensities. The pixel count is height * width as a
 * 32-bit product (wrapping); when that product is 0 or negative read as signed, no pixel is
 * read. Sizes are the caller's to keep non-negative: two negative sizes give a positive product,
 * and that many pixels are read. Sums are unsigned 32-bit and wrap modulo 2^32, divisions
 * truncate, and the variance is the population variance about the truncated mean. A count of 0
 * gives 0 instead of a division by zero. Histograms belong to the caller and must not overlap
 * src. Counting takes a few words of stack (3 KiB more in builds with vector variants), and so
 * do the image statistics, which keep no histogram. */

/* Clears all 256 bins of hist, then counts every pixel into the bin of its value. */
KEL_API void kel_image_histogram(const uint8_t *src, int32_t height, int32_t width, uint32_t *hist);

/* Clears bins 0 .. 2^bits - 1 of hist, leaves the bins beyond them untouched, and counts every
 * pixel into the bin of its top `bits` bits (value >> (8 - bits)). bits 0 counts all pixels into
 * bin 0; bits above 8 are taken as 8, the full 256-bin histogram. */
KEL_API void kel_image_histogram_n(const uint8_t *src, int32_t height, int32_t width, uint32_t bits,
                                   uint32_t *hist);

/* The low 8 bits of (sum of i * hist[i]) / count over the 256 bins; count is the number of
 * pixels the histogram holds. 0 when count is 0. */
KEL_API uint8_t kel_hist_mean(const uint32_t *hist, uint32_t count);

/* The low 16 bits of (sum of hist[i] * (i - mean)^2) / count, mean being what kel_hist_mean
 * returned for the same histogram and count. 0 when count is 0. */
KEL_API uint16_t kel_hist_var(const uint32_t *hist, uint8_t mean, uint32_t count);

/* floor(sqrt(v)), v = kel_hist_var(hist, mean, count), the root taken by tq_sqrt_24_5 of the
 * unsigned 32-bit v << 18 (as 4 * sqrt(v)). A v of 16384 or more, which only a count below the
 * histogram's total can give, loses its top bits in that shift. */
KEL_API uint8_t kel_hist_std(const uint32_t *hist, uint8_t mean, uint32_t count);

/* The variance of the image's intensities, equal to kel_hist_var of its histogram, taken in one
 * pass over the pixels (nothing is allocated). Stores the truncated mean in *mean_out unless
 * mean_out is null. An image with no pixels gives variance 0 and mean 0. */
KEL_API uint16_t kel_image_var(const uint8_t *src, int32_t height, int32_t width,
                               uint8_t *mean_out);

/* floor(sqrt(kel_image_var(src, height, width, mean_out))), storing the mean the same way. */
KEL_API uint8_t kel_image_std(const uint8_t *src, int32_t height, int32_t width, uint8_t *mean_out);

/* ---------------------------------------------------------------------------------------------
 * Rotation
 * ------------------------------------------------------------------------------------------- */

/* The three rotations turn a source raster by angle * 2pi / 256 about its corner (0, 0)
 * (clockwise on a display whose rows run downward, with our tq_sin_) onto a new canvas just
 * large enough for the turned rectangle, and differ only in pixel type, fill and resampling.
 *
 * Canvas: the corners (0, 0), (width, 0), (0, height) and (width, height) are turned with
 * cosA = tq_cos_(angle), sinA = tq_sin_(angle) (14 fraction bits), each coordinate divided by
 * 16384 truncating toward zero; the canvas spans them plus one row and one column (angle 0 gives
 * height + 1 rows and width + 1 columns). *offset_x, *offset_y receive the canvas column and row
 * of the source's corner (0, 0), never negative. The canvas is one malloc block of
 * *canvas_height x *canvas_width one-byte pixels (row stride *canvas_width) that belongs to the
 * caller, who releases it with free; the library keeps no reference to it.
 *
 * Mapping: every canvas pixel (k, r) shows the source position sx = cosB * dx - sinB * dy,
 * sy = sinB * dx + cosB * dy (1/16384 pixel) with dx = k - offset_x, dy = r - offset_y and
 * cosB, sinB those of the opposite angle (-angle) & 255. Canvas pixels that the source does not
 * cover keep the fill. The calls are tq_cos_(angle), tq_sin_(angle), malloc, then
 * tq_cos_((-angle) & 255), tq_sin_((-angle) & 255); none inside the pixel loop. All five outputs
 * are written on every call, before any pixel is resampled.
 *
 * Caller: src holds height x width pixels; the five output pointers point to distinct
 * variables. Sides below 16384 give exactly the 32-bit fixed-point result. Larger sides are
 * computed in 64-bit arithmetic, so they give the true rotation rather than a wrapped one.
 * Cosines and sines outside [-16384, 16384] are clamped into it.
 *
 * When no canvas can be made: if its sides do not fit int32_t or its byte count does not fit
 * size_t, *canvas is null and the four sizes and offsets are 0; if malloc fails, *canvas is
 * null and the sizes and offsets are those of the canvas that was asked for. Either way nothing
 * else is written, src is not read and the opposite angle's cosine and sine are not asked for.
 *
 * kel_image_rotate: unsigned pixels, fill 255, bilinear. A position is resampled only when its
 * whole part (x0, y0) = (sx >> 14, sy >> 14) has 0 <= x0 < width - 1 and 0 <= y0 < height - 1,
 * so the source's last row and column appear only as second neighbours. With fx = sx & 16383,
 * fy = sy & 16383 the four neighbours are weighted (16384 - fx) / fx and (16384 - fy) / fy in
 * 64-bit arithmetic and the total divided by 2^28, truncating (127.99 gives 127). A source of 0
 * rows and 0 columns gives a 1 x 1 canvas holding 255. */
KEL_API void kel_image_rotate(const uint8_t *src, uint32_t height, uint32_t width, uint8_t angle,
                              uint8_t **canvas, int32_t *canvas_height, int32_t *canvas_width,
                              int32_t *offset_y, int32_t *offset_x);
/* kel_image_rotate for signed pixels: fill 0, the same positions resampled, and the signed
 * bilinear total divided by 2^28 truncating toward zero (-0.5 gives 0, not -1). */
KEL_API void kel_image_rotate_int8(const int8_t *src, uint32_t height, uint32_t width,
                                   uint8_t angle, int8_t **canvas, int32_t *canvas_height,
                                   int32_t *canvas_width, int32_t *offset_y, int32_t *offset_x);
/* Nearest-neighbour rotation of signed pixels: each canvas pixel takes the source pixel
 * (sx >> 14, sy >> 14) whose square holds its position (rounding down) when 0 <= x < width and
 * 0 <= y < height, so the last row and column are reached too. -128 marks the uncovered canvas
 * pixels: it is the fill, and a source -128 is stored as -127. Negative sizes are accepted: the
 * canvas is made from them and nothing is covered. */
KEL_API void kel_image_rotate_int8_nn(const int8_t *src, int32_t height, int32_t width,
                                      uint8_t angle, int8_t **canvas, int32_t *canvas_height,
                                      int32_t *canvas_width, int32_t *offset_y, int32_t *offset_x);

/* Heap-free rotation, for firmware without a heap or with a fragmented one. The three rotations
 * above are exactly kel_rotation_canvas, malloc of the bytes it returns, then the matching _into
 * call: the same canvases, sizes and offsets, and the same calls of the math library in the same
 * order (tq_cos_ and tq_sin_ of the angle in the first, of the opposite angle in the second).
 *
 * kel_rotation_canvas: the canvas that a turn of a height x width source by angle needs (every
 * rotation makes the same one; sizes are read as 64-bit values, so pass either signedness).
 * Stores it in *canvas and returns canvas->height * canvas->width, at least 1; returns 0 and
 * stores zeros when its sides do not fit int32_t or its byte count does not fit size_t. A null
 * canvas is accepted (only the size is returned). */
typedef struct kel_canvas {
  int32_t height;   /* canvas rows */
  int32_t width;    /* canvas columns: the row stride of the canvas buffer */
  int32_t offset_y; /* canvas row of the source's corner (0, 0) */
  int32_t offset_x; /* canvas column of the source's corner (0, 0) */
} kel_canvas;
KEL_API size_t kel_rotation_canvas(int64_t height, int64_t width, uint8_t angle,
                                   kel_canvas *canvas);

/* The rotations into a caller's buffer of `capacity` bytes, laid out as canvas->height rows of
 * canvas->width pixels with no alignment needed: every pixel is set to the fill, then resampled
 * as the rotation above describes. When canvas or pixels is null, a side is not positive or
 * capacity is below height * width, nothing is written and the math library is not called. Any
 * canvas is safe, also one that kel_rotation_canvas did not make: positions are worked in 64-bit
 * arithmetic and only source pixels inside the source are read. Stack as the rotations. */
KEL_API void kel_image_rotate_into(const uint8_t *src, uint32_t height, uint32_t width,
                                   uint8_t angle, const kel_canvas *canvas, uint8_t *pixels,
                                   size_t capacity);
KEL_API void kel_image_rotate_int8_into(const int8_t *src, uint32_t height, uint32_t width,
                                        uint8_t angle, const kel_canvas *canvas, int8_t *pixels,
                                        size_t capacity);
KEL_API void kel_image_rotate_int8_nn_into(const int8_t *src, int32_t height, int32_t width,
                                           uint8_t angle, const kel_canvas *canvas, int8_t *pixels,
                                           size_t capacity);

/* ---------------------------------------------------------------------------------------------
 * Pixel operations and compositing
 * ------------------------------------------------------------------------------------------- */

/* The point operations below work on the n = height * width pixels of src, n formed in wrapping
 * unsigned 32-bit arithmetic (keeping it from wrapping is the caller's part); n = 0 reads and
 * writes nothing. The output may be src itself (the operation then works in place); otherwise
 * it must not overlap src. The caller supplies n bytes in each. */

/* Moves every pixel percent % of the way toward white: dst[i] = s + (p * (255 - s)) / 100 with
 * s = src[i] and p = min(percent, 100), the change rounded down. p = 0 copies; p >= 100 (a
 * negative percentage passed as unsigned included) gives all 255. */
KEL_API void kel_image_brighten(const uint8_t *src, uint32_t height, uint32_t width,
                                uint32_t percent, uint8_t *dst);

/* Moves every pixel percent % of the way toward black: dst[i] = s - (p * s) / 100, p as for
 * kel_image_brighten. p >= 100 gives all 0. */
KEL_API void kel_image_darken(const uint8_t *src, uint32_t height, uint32_t width, uint32_t percent,
                              uint8_t *dst);

/* mask[i] = 0 where src[i] equals key, 1 elsewhere: the hole mask that kel_mask_image fills. A
 * key outside 0 .. 255 equals no pixel and gives an all-1 mask. */
KEL_API void kel_get_mask(const uint8_t *src, uint32_t height, uint32_t width, int32_t key,
                          uint8_t *mask);

/* Paste and blend put the src_height x src_width plain raster src onto the dst_height x
 * dst_width plain raster dst, source pixel (sx, sy) landing on (x + sx, y + sy). Only the source
 * pixels that land inside dst are read, and only the destination pixels under them are written;
 * the clipping is computed once per call, in 64-bit arithmetic, so any x, y and sizes are safe
 * and non-positive destination sizes write nothing. A key of 0 .. 255 makes the source pixels of
 * that value transparent (the destination keeps its value there); 256 .. 65535 makes none
 * transparent. Rows are visited top to bottom and columns left to right, each source pixel read
 * just before its destination pixel is written, and the result is that of this order also when
 * the two rasters overlap in memory. Nothing is allocated.
 * A transparent pixel leaves its destination byte's value unchanged, but on CPUs without byte-
 * masked stores (all but AVX-512 among x86 ones, and Arm's NEON) the byte may be read and written
 * back with that same value, a vector at a time: as with any call, no other thread may write the
 * destination rows under the source while it runs. */

/* Paste: every visible, non-transparent source pixel replaces its destination pixel. */
KEL_API void kel_image_draw_image(uint8_t *dst, int32_t dst_height, int32_t dst_width,
                                  const uint8_t *src, uint16_t src_height, uint16_t src_width,
                                  int32_t x, int32_t y, uint16_t key);

/* Blend: every visible, non-transparent source pixel s turns its destination pixel d into
 * (d + s) >> 1, the average rounded down. */
KEL_API void kel_image_blend_image(uint8_t *dst, int32_t dst_height, int32_t dst_width,
                                   const uint8_t *src, uint16_t src_height, uint16_t src_width,
                                   int32_t x, int32_t y, uint16_t key);

/* Fills the hole of src (the pixels whose mask value is 0) with a smooth surface made from the
 * values along its edge, into dst; known pixels (mask 1 .. 255) keep their source values. Per
 * 8 x 8 block, the largest source value among the border pixels (interior known pixels with a
 * hole among their eight neighbours) is gathered; empty blocks take the largest value of their
 * filled neighbours, one ring per pass, until a pass fills nothing; the block grid is smoothed
 * in place by kel_blur_uint8 and enlarged eightfold by kel_scale_up_bilinear_uint8; every hole
 * pixel takes the enlarged value at its position; finally each interior hole pixel next to a
 * known one takes its value from kel_blur_uint8 of that result. Hole pixels in the first and
 * last rows and columns are filled but never softened.
 * dst is src itself (the fill works in place) or does not overlap it; mask does not overlap dst.
 * Takes four scratch buffers from malloc and frees them before it returns: the enlarged raster
 * (8 * ceil(height / 8) x 8 * ceil(width / 8) bytes), two block grids and a height x width
 * blurred copy. If one cannot be had, or its size does not fit size_t, the routine frees the
 * others and returns without writing dst or calling either sibling. A height or width above
 * 65528 (the enlarged sides would not fit 16 bits) returns at once in the same way. A zero
 * height or width writes nothing to dst; both siblings are still called, with the zero sizes. */
KEL_API void kel_mask_image(const uint8_t *src, uint16_t height, uint16_t width,
                            const uint8_t *mask, uint8_t *dst);

/* Heap-free fill. kel_mask_image_scratch_size gives the scratch bytes kel_mask_image_into needs
 * for a height x width fill (the four buffers above and 3 bytes for aligning them; at least 1),
 * or 0 when the fill cannot be done: a side above 65528, or a total that does not fit size_t.
 * kel_mask_image_into is kel_mask_image with that scratch given instead of taken from malloc,
 * any alignment: the same result and the same calls of the two siblings. When the scratch is
 * null or smaller than the size call says, or the fill cannot be done, it returns without
 * writing dst or the scratch and without calling either sibling. The scratch holds nothing of
 * value afterwards. Stack as kel_mask_image. */
KEL_API size_t kel_mask_image_scratch_size(uint16_t height, uint16_t width);
KEL_API void kel_mask_image_into(const uint8_t *src, uint16_t height, uint16_t width,
                                 const uint8_t *mask, uint8_t *dst, void *scratch,
                                 size_t scratch_bytes);

/* ---------------------------------------------------------------------------------------------
 * Drawing. Every pixel of a figure is clipped on its own: it is written exactly when
 * 0 <= x < width and 0 <= y < height; a raster with height <= 0 or width <= 0 receives nothing.
 * Figures are computed from their own parameters, so one that crosses an edge puts the same
 * pixels inside the raster as on a larger raster. Any coordinates and sizes are safe, and the
 * work is proportional to what lands inside the raster.
 * ------------------------------------------------------------------------------------------- */

/* Draws the one-pixel line from (x0, y0) to (x1, y1), both end points included: the end points
 * first, then one pixel per step of the major axis from the end with the smaller row, the minor
 * offset being (step * minor delta) / major delta truncated toward zero. Deltas and products
 * that leave 32 bits are computed in 64-bit arithmetic, so every line is the true line. */
KEL_API void kel_image_draw_line(uint8_t *buf, int32_t height, int32_t width, int32_t x0,
                                 int32_t y0, int32_t x1, int32_t y1, uint8_t colour);

/* Draws a triangle's outline as three kel_image_draw_line calls, in this order: (x0, y0) to
 * (x1, y1), (x1, y1) to (x2, y2), (x2, y2) to (x0, y0). The inside is not touched. */
KEL_API void kel_image_draw_triangle(uint8_t *buf, int32_t height, int32_t width, int32_t x0,
                                     int32_t y0, int32_t x1, int32_t y1, int32_t x2, int32_t y2,
                                     uint8_t colour);

/* Draws the one-pixel outline of a rect_width x rect_height rectangle whose top-left pixel is
 * (x, y): top and bottom rows column by column, then the sides on the rows strictly between.
 * Positions are 64-bit, so sizes that carry x + rect_width past 2^31 still draw the true
 * rectangle. A zero width draws only sides (columns x and x - 1, when rect_height >= 3); a zero
 * height only the rows y and y - 1. */
KEL_API void kel_image_draw_rectangle(uint8_t *buf, int32_t height, int32_t width, int32_t x,
                                      int32_t y, uint32_t rect_width, uint32_t rect_height,
                                      uint8_t colour);

/* Writes value in decimal with the built-in 4 x 7 digit font, each digit on a 6 x 9 box of
 * 255 - colour (box before glyph), digits 5 columns apart from x; (x, y) is the top-left of the
 * first glyph or of the minus sign, which takes a 5-column step of its own and has no box.
 * Leading zeros are drawn up to min_digits positions; value 0 with min_digits 0 draws nothing.
 * At most nine digits: values beyond +-999999999 (INT32_MIN included) saturate to +-999999999,
 * so a fixed-width display shows all nines rather than a wrong number. */
KEL_API void kel_image_draw_number(uint8_t *buf, int32_t height, int32_t width, int32_t value,
                                   uint8_t min_digits, int32_t x, int32_t y, uint8_t colour);

/* Draws the outline of an octagonal circle that fills a diameter x diameter box around (x, y):
 * four straight edges and four diagonal runs, about 3 * diameter pixels, the inside untouched.
 * For odd diameters (x, y) is the centre; for even ones the top-left of the four central
 * pixels. Diameter 1 is the pixel (x, y), 2 the 2 x 2 block from (x, y), 0 nothing. Positions
 * are 64-bit, so any diameter up to 2^32 - 1 draws the true figure. */
KEL_API void kel_image_draw_circle(uint8_t *buf, int32_t height, int32_t width, uint32_t diameter,
                                   int32_t x, int32_t y, uint8_t colour);

#ifdef __cplusplus
} /* extern "C" */
#endif

#endif /* KEL_IMAGES_H */
