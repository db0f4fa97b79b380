// The kernel sweep: every kernel of every table this machine can run, against its plain body.
// Rows of every length from 0 to three of the widest vectors and one more, at every relative
// alignment of input and output within the widest vector, with inputs that send a keyed row down
// each of its paths, and guard bytes around every output. A failure names the table, the kernel,
// the case and the first differing byte. Depends on the library and the C library only, so that
// boards without a file system or GoogleTest run it too.
//   kernel_sweep        prints each failure and "N passed, M failed"
#include <stdint.h>
#include <stdio.h>
#include <string.h>

#include "kel_outside.h"
#include "kernels.h"
#if KEL_USE_HIGHWAY && !defined(HWY_COMPILE_ONLY_STATIC)
#include <hwy/targets.h>
#endif

namespace {

constexpr size_t kWidest = 64;  // bytes in the widest vector of any target
constexpr size_t kLongest = 3 * kWidest + 1;
constexpr size_t kGuard = 64;
constexpr size_t kBuffer = kGuard + kWidest + kLongest + 4200 + kGuard;
constexpr uint8_t kGuardByte = 0xA5;

// The input's offsets from the output's alignment tried at a length: all of them for short rows
// and every eighth length, a spread of four otherwise, which keeps the sweep to seconds on an
// emulated board.
size_t shift_step(size_t length) {
  return length < 24 || length % 8 == 0 ? 1 : 17;
}

uint32_t next(uint32_t &s) {
  s ^= s << 13, s ^= s >> 17, s ^= s << 5;
  return s;
}

struct Tally {
  unsigned passed = 0, failed = 0;
  // Compares n bytes; on a difference prints the first one and counts a failure.
  void same(const char *table, const char *kernel, const char *what, size_t length, size_t shift,
            const uint8_t *expected, const uint8_t *got, size_t n, size_t origin) {
    for (size_t i = 0; i < n; ++i) {
      if (expected[i] != got[i]) {
        // Sizes printed as unsigned long: newlib for microcontrollers may not know %zu.
        printf("FAIL %s %s, %s, length %lu, input %lu bytes off: byte %lld expected %u got %u\n",
               table, kernel, what, static_cast<unsigned long>(length),
               static_cast<unsigned long>(shift),
               static_cast<long long>(i) - static_cast<long long>(origin), expected[i], got[i]);
        ++failed;
        return;
      }
    }
    ++passed;
  }
};

// Input patterns for a row: the names say what a keyed row sees with key 7.
enum Pattern { kRandom, kAllKey, kNoKey, kAlternating, kPatterns };
const char *const kPatternNames[] = {"random, key in a quarter", "all transparent",
                                     "none transparent", "alternating"};

void fill_input(Pattern p, uint32_t seed, uint8_t *bytes, size_t n) {
  for (size_t i = 0; i < n; ++i) {
    const auto r = static_cast<uint8_t>(next(seed) >> 7);
    switch (p) {
      case kRandom:
        bytes[i] = (r & 3) == 0 ? 7 : r;
        break;
      case kAllKey:
        bytes[i] = 7;
        break;
      case kNoKey:
        bytes[i] = r == 7 ? 8 : r;
        break;
      default:
        bytes[i] = (i & 1) != 0 ? 7 : r;
        break;
    }
  }
}

// A row kernel as the routines run it: the variant from the start, the plain body the rest.
struct RowCase {
  const char *name;
  size_t (*run)(const kel::Kernels &k, const uint8_t *in, size_t count, uint8_t *out, int param);
  int params[5];
};

template <size_t (*const kel::Kernels::*entry)(const uint8_t *, size_t, uint8_t *)>
size_t plain_row(const kel::Kernels &k, const uint8_t *in, size_t count, uint8_t *out, int) {
  const size_t done = (k.*entry)(in, count, out);
  if (done <= count) (kel::kPlainKernels.*entry)(in + done, count - done, out + done);
  return done;
}

template <typename Param,
          size_t (*const kel::Kernels::*entry)(const uint8_t *, size_t, Param, uint8_t *)>
size_t param_row(const kel::Kernels &k, const uint8_t *in, size_t count, uint8_t *out, int param) {
  const auto p = static_cast<Param>(param);
  const size_t done = (k.*entry)(in, count, p, out);
  if (done <= count) (kel::kPlainKernels.*entry)(in + done, count - done, p, out + done);
  return done;
}

const RowCase kRows[] = {
    {"brighten", param_row<uint16_t, &kel::Kernels::brighten>, {0, 1, 37, 99, 100}},
    {"darken", param_row<uint16_t, &kel::Kernels::darken>, {0, 1, 37, 99, 100}},
    {"mask", param_row<uint8_t, &kel::Kernels::mask>, {7, 7, 7, 7, 7}},
    {"copy", plain_row<&kel::Kernels::copy>, {0, 0, 0, 0, 0}},
    {"blend", plain_row<&kel::Kernels::blend>, {0, 0, 0, 0, 0}},
    {"paste_keyed", param_row<uint8_t, &kel::Kernels::paste_keyed>, {7, 7, 7, 7, 7}},
    {"blend_keyed", param_row<uint8_t, &kel::Kernels::blend_keyed>, {7, 7, 7, 7, 7}},
};

void sweep_rows(const kel::Kernels &k, Tally &tally) {
  static uint8_t in[kBuffer], expected[kBuffer], got[kBuffer];
  // Outputs on the widest vector's boundary, and off it so that a variant's lead-in runs.
  static const size_t kOutputOffsets[] = {0, 17, 47};
  char what[96];
  for (const RowCase &row : kRows) {
    for (int setting = 0; setting < 5; ++setting) {
      const int p = setting % kPatterns;
      const int param = row.params[setting];
      for (const size_t out_offset : kOutputOffsets) {
        for (size_t length = 0; length <= kLongest; ++length) {
          const size_t step = out_offset == 0 ? shift_step(length) : 17;
          for (size_t shift = 0; shift < kWidest; shift += step) {
            const uint32_t seed = static_cast<uint32_t>(length * 131 + shift * 7 + 1);
            fill_input(static_cast<Pattern>(p), seed, in + kGuard + shift, length);
            // Guarded on both sides, the output holds bytes the blends read.
            const size_t base = kGuard + out_offset, end = base + length + kGuard;
            for (size_t i = 0; i < end; ++i) expected[i] = got[i] = static_cast<uint8_t>(i * 29);
            memset(expected, kGuardByte, base), memset(got, kGuardByte, base);
            memset(expected + base + length, kGuardByte, kGuard);
            memset(got + base + length, kGuardByte, kGuard);
            row.run(kel::kPlainKernels, in + kGuard + shift, length, expected + base, param);
            const size_t done = row.run(k, in + kGuard + shift, length, got + base, param);
            snprintf(what, sizeof what, "%s, setting %d, output %lu bytes off", kPatternNames[p],
                     param, static_cast<unsigned long>(out_offset));
            if (done > length) {
              printf("FAIL %s %s, %s, length %lu: did %lu pixels\n", k.name, row.name, what,
                     static_cast<unsigned long>(length), static_cast<unsigned long>(done));
              ++tally.failed;
              continue;
            }
            tally.same(k.name, row.name, what, length, shift, expected, got, end, base);
          }
        }
      }
    }
  }
}

// The point operations also run in place: output and input one buffer.
void sweep_in_place(const kel::Kernels &k, Tally &tally) {
  static uint8_t expected[kBuffer], got[kBuffer];
  for (const RowCase &row : kRows) {
    for (size_t length = 0; length <= kLongest; length += 7) {
      fill_input(kRandom, static_cast<uint32_t>(length + 3), expected, length + 2 * kGuard);
      memcpy(got, expected, length + 2 * kGuard);
      row.run(kel::kPlainKernels, expected + kGuard, length, expected + kGuard, row.params[2]);
      row.run(k, got + kGuard, length, got + kGuard, row.params[2]);
      tally.same(k.name, row.name, "in place", length, 0, expected, got, length + 2 * kGuard,
                 kGuard);
    }
  }
}

// Histograms of every bit count and the pixel sums, over short rows at every alignment and long
// ones that take a variant's lead-in and blocks.
void sweep_statistics(const kel::Kernels &k, Tally &tally) {
  static uint8_t pixels[kBuffer];
  fill_input(kNoKey, 99, pixels, kBuffer);
  for (size_t length = 0; length <= kLongest + 4200; length += length < kLongest ? 1 : 523) {
    for (size_t shift = 0; shift < kWidest; shift += 4 * shift_step(length)) {
      const uint8_t *at = pixels + shift;
      for (uint32_t bits = 0; bits <= 8; ++bits) {
        uint32_t expected[257] = {}, got[257] = {};
        const size_t done = k.count_bins(at, length, bits, got);
        kel::kPlainKernels.count_bins(at + done, length - done, bits, got);
        kel::kPlainKernels.count_bins(at, length, bits, expected);
        char what[32];
        snprintf(what, sizeof what, "%u bits", static_cast<unsigned>(bits));
        tally.same(k.name, "count_bins", what, length, shift,
                   reinterpret_cast<const uint8_t *>(expected),
                   reinterpret_cast<const uint8_t *>(got), sizeof expected, 0);
      }
      kel::PixelSums expected{1, 2}, got{1, 2};
      const size_t done = k.sum_pixels(at, length, &got);
      kel::kPlainKernels.sum_pixels(at + done, length - done, &got);
      kel::kPlainKernels.sum_pixels(at, length, &expected);
      tally.same(k.name, "sum_pixels", "sums", length, shift,
                 reinterpret_cast<const uint8_t *>(&expected),
                 reinterpret_cast<const uint8_t *>(&got), sizeof expected, 0);
    }
  }
}

// The last hole of rows whose zeros lie anywhere, or nowhere.
void sweep_tails(const kel::Kernels &k, Tally &tally) {
  static uint8_t bytes[kBuffer];
  for (size_t length = 0; length <= kLongest; ++length) {
    for (size_t zero = 0; zero <= length; zero += 1 + length / 16) {
      for (size_t i = 0; i < length; ++i) bytes[i] = static_cast<uint8_t>(1 + i % 200);
      if (zero < length) bytes[zero] = 0;
      const size_t expected = kel::kPlainKernels.nonzero_tail(bytes, length);
      const size_t variant = k.nonzero_tail(bytes, length);
      const size_t got = variant > length
                             ? variant
                             : variant + kel::kPlainKernels.nonzero_tail(bytes, length - variant);
      tally.same(k.name, "nonzero_tail", "zero placed", length, zero,
                 reinterpret_cast<const uint8_t *>(&expected),
                 reinterpret_cast<const uint8_t *>(&got), sizeof expected, 0);
    }
  }
}

// Runs through sources of a few shapes along the turns of several angles, every position inside.
// One run on table k's entry, the plain body finishing it, against the plain body alone.
template <typename Pixel>
void check_run(const kel::Kernels &k, kel::RotationRow<Pixel> kel::Kernels::*entry,
               const char *name, const kel::RotationRun &run, const char *what, Tally &tally) {
  Pixel expected[kLongest + kGuard], got[kLongest + kGuard];
  memset(expected, kGuardByte, sizeof expected), memset(got, kGuardByte, sizeof got);
  (kel::kPlainKernels.*entry)(run, expected);
  const size_t done = (k.*entry)(run, got);
  kel::RotationRun rest = run;
  rest.x += int64_t{run.step_x} * static_cast<int64_t>(done);
  rest.y += int64_t{run.step_y} * static_cast<int64_t>(done);
  rest.count -= done;
  if (done <= run.count) (kel::kPlainKernels.*entry)(rest, got + done);
  tally.same(k.name, name, what, run.count, 0, reinterpret_cast<const uint8_t *>(expected),
             reinterpret_cast<const uint8_t *>(got), sizeof expected, 0);
}

template <typename Pixel>
void sweep_rotation(const kel::Kernels &k, kel::RotationRow<Pixel> kel::Kernels::*entry,
                    const char *name, int64_t reach, Tally &tally) {
  static uint8_t source[70 * 70];
  fill_input(kRandom, 5, source, sizeof source);
  source[0] = 0x80;  // a signed -128, which the nearest-neighbour run stores as -127
  static const int64_t kShapes[][2] = {{2, 2}, {3, 70}, {70, 3}, {37, 61}, {70, 70}};
  for (const auto &shape : kShapes) {
    const int64_t height = shape[0], width = shape[1];
    for (int angle = 0; angle < 256; angle += 11) {
      const int32_t cos = tq_cos_(static_cast<uint8_t>(angle));
      const int32_t sin = tq_sin_(static_cast<uint8_t>(angle));
      const int64_t x_high = (width - reach) * 16384, y_high = (height - reach) * 16384;
      // Start near each corner region and walk while the position stays inside.
      for (int start = 0; start < 4; ++start) {
        kel::RotationRun run{source,
                             height,
                             width,
                             (start & 1) != 0 ? x_high - 1 - 77 * start : 3,
                             (start & 2) != 0 ? y_high - 1 - 55 * start : 5,
                             cos,
                             sin,
                             0};
        if (run.x < 0 || run.y < 0 || run.x >= x_high || run.y >= y_high) continue;
        for (int64_t x = run.x, y = run.y;
             x >= 0 && y >= 0 && x < x_high && y < y_high && run.count < kLongest;
             x += cos, y += sin) {
          ++run.count;
        }
        char what[64];
        snprintf(what, sizeof what, "%lldx%lld angle %d start %d", static_cast<long long>(height),
                 static_cast<long long>(width), angle, start);
        check_run(k, entry, name, run, what, tally);
      }
    }
  }
  // Totals just above a whole multiple of 2^28: a source of v with v + 1 at its odd columns of
  // odd rows, read at fractions fx, fy past even whole points, gives v * 2^28 + fx * fy, which a
  // signed run truncates toward zero to v + 1 when v is negative, however small fx * fy is.
  constexpr int64_t kHeight = 4, kWidth = 40;
  static const int kValues[] = {-128, -3, -1, 0, 2, 126};
  static const int32_t kFractions[] = {0, 1, 5, 127, 16383};
  for (const int v : kValues) {
    for (int64_t y = 0; y < kHeight; ++y) {
      for (int64_t x = 0; x < kWidth; ++x)
        source[y * kWidth + x] = static_cast<uint8_t>(v + ((x & y & 1) != 0 ? 1 : 0));
    }
    for (const int32_t fx : kFractions) {
      for (const int32_t fy : kFractions) {
        const kel::RotationRun run{source, kHeight, kWidth, fx, 2 * 16384 + fy, 2 * 16384, 0, 19};
        char what[64];
        snprintf(what, sizeof what, "near whole %d, fractions %ld %ld", v, static_cast<long>(fx),
                 static_cast<long>(fy));
        check_run(k, entry, name, run, what, tally);
      }
    }
  }
}

void sweep(const kel::Kernels &k, Tally &tally) {
  sweep_rows(k, tally);
  sweep_in_place(k, tally);
  sweep_statistics(k, tally);
  sweep_tails(k, tally);
  sweep_rotation<uint8_t>(k, &kel::Kernels::rotate_u8, "rotate_u8", 1, tally);
  sweep_rotation<int8_t>(k, &kel::Kernels::rotate_i8, "rotate_i8", 1, tally);
  sweep_rotation<int8_t>(k, &kel::Kernels::rotate_i8_nn, "rotate_i8_nn", 0, tally);
}

}  // namespace

int main() {
  Tally tally;
#if KEL_USE_HIGHWAY && !defined(HWY_COMPILE_ONLY_STATIC)
  for (const int64_t target : hwy::SupportedAndGeneratedTargets()) {
    hwy::SetSupportedTargetsForTest(target);
    sweep(kel::kernels(), tally);
  }
  hwy::SetSupportedTargetsForTest(0);
#else
  sweep(kel::kernels(), tally);
#endif
  printf("%u passed, %u failed\n", tally.passed, tally.failed);
  return tally.failed == 0 ? 0 : 1;
}
