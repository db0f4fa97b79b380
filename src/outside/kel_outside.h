/* The functions kel_images calls outside itself, and what it relies on from each.
 *
 * The kel_images library does not define them. The kel_images_outside library holds our
 * defaults; a host that has its own fixed-point math or image functions links those instead,
 * provided they keep the contracts below. */
#ifndef KEL_OUTSIDE_H
#define KEL_OUTSIDE_H

#include <stdint.h>

#if defined(KEL_IMAGES_SHARED) && (defined(__GNUC__) || defined(__clang__))
#define KEL_OUTSIDE_API __attribute__((visibility("default")))
#else
#define KEL_OUTSIDE_API
#endif

#ifdef __cplusplus
extern "C" {
#endif

/* Cosine and sine of angle * 2pi / 256, times 16384 (14 fraction bits), in -16384 .. 16384.
 * The rotations use tq_cos_((-a) & 255) and tq_sin_((-a) & 255) as the exact inverse of the
 * turn by a, so the pair must describe one rotation of period 256: cos(-a) == cos(a) and
 * sin(-a) == -sin(a). Ours are exact at the quarter turns and positive in sine for 1 .. 127. */
KEL_OUTSIDE_API int32_t tq_cos_(uint8_t angle);
KEL_OUTSIDE_API int32_t tq_sin_(uint8_t angle);

/* Square root of x read with 24 fraction bits, returned with 5 fraction bits (sqrt(x) / 128),
 * rounded down. The statistics call it with v << 18 and take (r >> 2) as floor(sqrt(v)). */
KEL_OUTSIDE_API uint32_t tq_sqrt_24_5(uint32_t x);

/* Smooths the height x width raster `in` into `out` (same size, row stride width), which is
 * either `in` itself or a raster that does not overlap it. The masked fill relies on it working
 * in place (in == out) and accepting zero sizes.
 * Ours: a 3 x 3 binomial blur, [1 2 1] / 4 along the rows and then along the columns, each pass
 * rounding half up ((a + 2b + c + 2) >> 2) and repeating the edge pixels beyond the border. A
 * constant raster stays constant. No heap; under 1 KiB of stack. */
KEL_OUTSIDE_API void kel_blur_uint8(const uint8_t *in, uint16_t height, uint16_t width,
                                    uint8_t *out);

/* Bilinear enlargement of the in_height x in_width raster `in` by `factor` into the
 * out_height x out_width raster `out` (row stride out_width). The masked fill relies on every
 * output pixel being written and on zero sizes being accepted.
 * Ours: sample centres are aligned, so the centre of output pixel i lies at input position
 * (i + 1/2) / factor - 1/2; positions before the first or after the last input sample take that
 * sample, which also covers an output larger than input * factor. Weights carry 8 fraction bits
 * (rounded down); the result, 16 fraction bits, is rounded half up. An empty input or a factor
 * of 0 gives an all-0 output. No heap; under 1 KiB of stack. */
KEL_OUTSIDE_API void kel_scale_up_bilinear_uint8(const uint8_t *in, uint16_t in_height,
                                                 uint16_t in_width, uint16_t factor, uint8_t *out,
                                                 uint16_t out_height, uint16_t out_width);

#ifdef __cplusplus
} /* extern "C" */
#endif

#endif /* KEL_OUTSIDE_H */
