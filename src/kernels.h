// The kernel table: every hot loop of the library as a row or run operation with one plain body.
//
// The plain body is the reference. It is the same function in every build (desktop, without
// Highway, Cortex-M, built for size), and it finishes whatever a variant leaves. A variant does
// the first pixels of its row, the whole vectors or words it handles, and returns how many it
// did; it may return 0 for a row it does not take. So there is one way to end a row: the plain
// body does the rest.
//
// The table a call runs on comes from one place, kernels(): Highway's run-time choice among the
// instruction sets it was built for where Highway runs, otherwise the entries this compiler's
// target enables (the Arm DSP and Helium variants) over the plain ones. Public routines clip,
// size and allocate once, take the table once, and then call through it. Tests and benchmarks
// walk every table the machine can run, so a new variant is proven and timed without a new test.
#ifndef KEL_KERNELS_H_
#define KEL_KERNELS_H_

#include <cstddef>
#include <cstdint>

namespace kel {

// The sum of the pixel values and the sum of their squares, both wrapped modulo 2^32.
struct PixelSums {
  uint32_t sum;
  uint32_t sum_of_squares;
};

// A run of `count` consecutive canvas pixels of one row of a rotation. The first shows source
// position (x, y), in units of 1/16384 pixel, and each next one is (step_x, step_y) further.
// Every position of the run lies where the rotation resamples: inside the source, with both
// bilinear neighbours for the bilinear rotations.
struct RotationRun {
  const void *src;
  int64_t height, width;
  int64_t x, y;
  int32_t step_x, step_y;
  size_t count;
};

// out[i] from in[i] alone, or from in[i] and out[i]; `Param` is the row's one setting.
using Row = size_t (*)(const uint8_t *in, size_t count, uint8_t *out);
template <typename Param>
using RowWith = size_t (*)(const uint8_t *in, size_t count, Param param, uint8_t *out);
template <typename Pixel>
using RotationRow = size_t (*)(const RotationRun &run, Pixel *out);

struct Kernels {
  const char *name;  // the instruction set: "plain", "AVX2", "NEON", "DSP", ...

  // Point operations. percent is 0 .. 100: out = in + floor(percent * (255 - in) / 100) and
  // in - floor(percent * in / 100). mask: out = 0 where in equals key, else 1.
  RowWith<uint16_t> brighten, darken;
  RowWith<uint8_t> mask;

  // Paste and blend rows. copy: out = in. blend: out = (out + in) >> 1. The keyed ones change
  // out[i] only where in[i] differs from key. A variant may store a transparent pixel's
  // destination byte back unchanged (a read and a write of the same value).
  Row copy, blend;
  RowWith<uint8_t> paste_keyed, blend_keyed;

  // Asks for the lines of count bytes from `at` to be brought in for writing: a hint that reads
  // and writes nothing. `at` may lie past the raster; it is used as a number, never read.
  void (*prefetch_for_writing)(uintptr_t at, size_t count);
  // Whether paste_keyed reads its destination row (it chooses each byte in a register and stores
  // whole words or vectors). The row then brings those lines in itself, and asking for them ahead
  // as well only adds work; a row that stores only its opaque pixels gains from the hint.
  bool paste_keyed_reads_out;

  // Statistics; both add to what the caller's accumulators hold. count_bins counts each pixel
  // into hist[pixel >> (8 - bits)] (bits 0 .. 8); counts stay below 2^31.
  size_t (*count_bins)(const uint8_t *pixels, size_t count, uint32_t bits, uint32_t *hist);
  size_t (*sum_pixels)(const uint8_t *pixels, size_t count, PixelSums *sums);

  // Rotation runs: unsigned bilinear, signed bilinear (truncated toward zero) and signed nearest
  // neighbour (-128 stored as -127).
  RotationRow<uint8_t> rotate_u8;
  RotationRow<int8_t> rotate_i8;
  RotationRow<int8_t> rotate_i8_nn;

  // The fill's search for the last hole of a mask row: how many bytes at the END of
  // bytes[0 .. count) hold no zero. A variant counts whole vectors from the end; the plain body
  // then goes on before them.
  size_t (*nonzero_tail)(const uint8_t *bytes, size_t count);
};

namespace plain {
size_t brighten(const uint8_t *in, size_t count, uint16_t percent, uint8_t *out);
size_t darken(const uint8_t *in, size_t count, uint16_t percent, uint8_t *out);
size_t mask(const uint8_t *in, size_t count, uint8_t key, uint8_t *out);
// Gives the result of out[i] = in[i] for i = 0, 1, ... in turn for any overlap of the two.
size_t copy(const uint8_t *in, size_t count, uint8_t *out);
size_t blend(const uint8_t *in, size_t count, uint8_t *out);
size_t paste_keyed(const uint8_t *in, size_t count, uint8_t key, uint8_t *out);
size_t blend_keyed(const uint8_t *in, size_t count, uint8_t key, uint8_t *out);
void prefetch_for_writing(uintptr_t at, size_t count);
size_t count_bins(const uint8_t *pixels, size_t count, uint32_t bits, uint32_t *hist);
size_t sum_pixels(const uint8_t *pixels, size_t count, PixelSums *sums);
size_t rotate_u8(const RotationRun &run, uint8_t *out);
size_t rotate_i8(const RotationRun &run, int8_t *out);
size_t rotate_i8_nn(const RotationRun &run, int8_t *out);
size_t nonzero_tail(const uint8_t *bytes, size_t count);
}  // namespace plain

// The plain bodies, as a table.
inline constexpr Kernels kPlainKernels = {"plain",
                                          plain::brighten,
                                          plain::darken,
                                          plain::mask,
                                          plain::copy,
                                          plain::blend,
                                          plain::paste_keyed,
                                          plain::blend_keyed,
                                          plain::prefetch_for_writing,
                                          false,
                                          plain::count_bins,
                                          plain::sum_pixels,
                                          plain::rotate_u8,
                                          plain::rotate_i8,
                                          plain::rotate_i8_nn,
                                          plain::nonzero_tail};

#ifndef KEL_USE_HIGHWAY
#define KEL_USE_HIGHWAY 0
#endif

#if KEL_USE_HIGHWAY
// The table this machine runs: Highway's choice among the instruction sets it was built for.
const Kernels &kernels();
#else

// Compile-time variants for the Arm cores Highway does not build for, in src/arm/: the DSP
// extension's SIMD32 (Cortex-M4, M7, M33, M55) and Helium (MVE: Cortex-M55, M85). A Helium table
// takes the DSP entries where it has none of its own.
#if defined(__ARM_FEATURE_DSP) && defined(__arm__)
#define KEL_ARM_DSP 1
#else
#define KEL_ARM_DSP 0
#endif
#if defined(__ARM_FEATURE_MVE) && defined(__arm__)
#define KEL_ARM_MVE 1
#else
#define KEL_ARM_MVE 0
#endif

#if KEL_ARM_DSP
namespace dsp {
size_t copy(const uint8_t *in, size_t count, uint8_t *out);
size_t brighten(const uint8_t *in, size_t count, uint16_t percent, uint8_t *out);
size_t darken(const uint8_t *in, size_t count, uint16_t percent, uint8_t *out);
size_t mask(const uint8_t *in, size_t count, uint8_t key, uint8_t *out);
size_t blend(const uint8_t *in, size_t count, uint8_t *out);
size_t paste_keyed(const uint8_t *in, size_t count, uint8_t key, uint8_t *out);
size_t blend_keyed(const uint8_t *in, size_t count, uint8_t key, uint8_t *out);
size_t sum_pixels(const uint8_t *pixels, size_t count, PixelSums *sums);
}  // namespace dsp
#endif

#if KEL_ARM_MVE
namespace mve {
size_t brighten(const uint8_t *in, size_t count, uint16_t percent, uint8_t *out);
size_t darken(const uint8_t *in, size_t count, uint16_t percent, uint8_t *out);
size_t mask(const uint8_t *in, size_t count, uint8_t key, uint8_t *out);
size_t copy(const uint8_t *in, size_t count, uint8_t *out);
size_t blend(const uint8_t *in, size_t count, uint8_t *out);
size_t paste_keyed(const uint8_t *in, size_t count, uint8_t key, uint8_t *out);
size_t blend_keyed(const uint8_t *in, size_t count, uint8_t key, uint8_t *out);
size_t count_bins(const uint8_t *pixels, size_t count, uint32_t bits, uint32_t *hist);
size_t sum_pixels(const uint8_t *pixels, size_t count, PixelSums *sums);
size_t rotate_u8(const RotationRun &run, uint8_t *out);
size_t rotate_i8(const RotationRun &run, int8_t *out);
size_t rotate_i8_nn(const RotationRun &run, int8_t *out);
}  // namespace mve
#endif

// The table this build runs, known when compiling: each routine then calls its own kernels
// directly, and a firmware that calls one routine carries only that routine's kernels.
#if KEL_ARM_MVE
inline constexpr Kernels kCompiledKernels = {"MVE",
                                             mve::brighten,
                                             mve::darken,
                                             mve::mask,
                                             mve::copy,
                                             mve::blend,
                                             mve::paste_keyed,
                                             mve::blend_keyed,
                                             plain::prefetch_for_writing,
                                             false,
                                             mve::count_bins,
                                             mve::sum_pixels,
                                             mve::rotate_u8,
                                             mve::rotate_i8,
                                             mve::rotate_i8_nn,
                                             plain::nonzero_tail};
#elif KEL_ARM_DSP
inline constexpr Kernels kCompiledKernels = {"DSP",
                                             dsp::brighten,
                                             dsp::darken,
                                             dsp::mask,
                                             dsp::copy,
                                             dsp::blend,
                                             dsp::paste_keyed,
                                             dsp::blend_keyed,
                                             plain::prefetch_for_writing,
                                             true,
                                             plain::count_bins,
                                             dsp::sum_pixels,
                                             plain::rotate_u8,
                                             plain::rotate_i8,
                                             plain::rotate_i8_nn,
                                             plain::nonzero_tail};
#else
inline constexpr Kernels kCompiledKernels = kPlainKernels;
#endif
constexpr const Kernels &kernels() {
  return kCompiledKernels;
}
#endif

// Whether the destination range starts inside the source range, after its first byte. Only then
// can a row write a source byte it has not read yet, so only then must the row be done pixel by
// pixel, by the plain body alone; a destination at or before the source only ever overwrites
// source bytes already read, so reading ahead gives the same result.
inline bool starts_inside(const uint8_t *to, const uint8_t *from, size_t count) {
  const uintptr_t to_address = reinterpret_cast<uintptr_t>(to);
  const uintptr_t from_address = reinterpret_cast<uintptr_t>(from);
  return to_address > from_address && to_address - from_address < count;
}

// Always inlined, so that where the table is known when compiling each routine calls its own
// kernels directly and carries no others.
#if defined(__GNUC__)
#define KEL_ALWAYS_INLINE inline __attribute__((always_inline))
#else
#define KEL_ALWAYS_INLINE inline
#endif

// A row on the `best` table: its variant does the first pixels unless the row must go in order,
// and the plain body the rest.
KEL_ALWAYS_INLINE void run_row(Row Kernels::*entry, const Kernels &best, const uint8_t *in,
                               size_t count, uint8_t *out) {
  const size_t done = starts_inside(out, in, count) ? 0 : (best.*entry)(in, count, out);
  if (done < count) (kPlainKernels.*entry)(in + done, count - done, out + done);
}

template <typename Param>
KEL_ALWAYS_INLINE void run_row(RowWith<Param> Kernels::*entry, const Kernels &best,
                               const uint8_t *in, size_t count, Param param, uint8_t *out) {
  const size_t done = starts_inside(out, in, count) ? 0 : (best.*entry)(in, count, param, out);
  if (done < count) (kPlainKernels.*entry)(in + done, count - done, param, out + done);
}

}  // namespace kel

#endif  // KEL_KERNELS_H_
