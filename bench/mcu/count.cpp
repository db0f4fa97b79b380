// Counts the instructions each routine takes on an emulated Cortex-M, for bench/mcu/count.py.
// Run under qemu-system-arm -icount shift=0, where every instruction advances the virtual clock
// by exactly one nanosecond, so the counts are exact and the same on every run. Prints one line
// per case: "count <case> <instructions> <units>", units being pixels (canvas pixels for the
// rotations, pixels written for the figures).
//
// The clock is read through the core's SysTick, the one timer both boards give at the core's
// clock: 25 MHz on the MPS2-AN386, 32 MHz on the MPS3-AN547, so a single reading tells only
// which 40 (or 31.25) instructions a moment lies in. (Semihosting's elapsed time is the host's,
// and the emulator has no cycle counter.) A stamp therefore takes a series of readings a fixed
// number of instructions apart, a number that moves each reading to another phase of the tick;
// each reading bounds the stamp's moment from both sides, and together they pin it to one
// instruction.
#include <stdint.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>

#include "kel_images.h"

namespace {

// ---- The clock ----------------------------------------------------------------------------------

volatile uint32_t *const kSysTick = reinterpret_cast<volatile uint32_t *>(0xE000E010);
constexpr uint32_t kTickMask = 0xFFFFFF;  // SysTick counts down through 24 bits
// One tick in quarter instructions: 40 ns at 25 MHz, 31.25 ns at 32 MHz; set from the core's
// part number (CPUID), which names the board.
int64_t g_tick_quarters = 160;
// 41 instructions between readings: 1 past a whole tick at 40 ns, 9.75 at 31.25 ns, so 125
// readings fall on every quarter-instruction phase of either tick.
constexpr int64_t kSpacingQuarters = 4 * 41;
constexpr int kReadings = 125;

struct Stamp {
  uint32_t reading[kReadings];
};

// The readings of a stamp, each 41 instructions after the last: the same instructions whatever
// the clock says, so that stamping costs a fixed count, taken off by calibrating.
__attribute__((naked, noinline)) void take_stamp(Stamp *) {
  __asm__ volatile(
      "movw r1, #0xE018\n\t"
      "movt r1, #0xE000\n\t"
      "movs r2, #125\n"
      "1:\n\t"
      "ldr r3, [r1]\n\t"
      "str r3, [r0], #4\n\t"
      ".rept 37\n\t"
      "nop\n\t"
      ".endr\n\t"
      "subs r2, r2, #1\n\t"
      "bne 1b\n\t"
      "bx lr\n");
}

// The span of moments (in quarter instructions, from the tick that `from` started in) that
// agree with every reading of the stamp: [low, high).
struct Span {
  int64_t low, high;
};
Span moment(const Stamp &from, const Stamp &s) {
  Span span{INT64_MIN, INT64_MAX};
  for (int k = 0; k < kReadings; ++k) {
    const int64_t ticks = (from.reading[0] - s.reading[k]) & kTickMask;
    const int64_t low = ticks * g_tick_quarters - k * kSpacingQuarters;
    if (low > span.low) span.low = low;
    if (low + g_tick_quarters < span.high) span.high = low + g_tick_quarters;
  }
  return span;
}

// Instructions from stamp a to stamp b: the one whole number of instructions both spans allow.
int64_t instructions_between(const Stamp &a, const Stamp &b) {
  const Span start = moment(a, a), end = moment(a, b);
  const int64_t above = end.low - start.high, below = end.high - start.low;  // 4n in (above, below)
  const int64_t n = (above >= 0 ? above / 4 : -((3 - above) / 4)) + 1;       // the least 4n > above
  if (start.low >= start.high || end.low >= end.high || 4 * n >= below || 4 * (n + 1) < below) {
    printf("error: the clock's readings do not give one count\n");
    exit(3);
  }
  return n;
}

Stamp g_before, g_after;

// The instructions fn takes, beyond those of an empty function.
__attribute__((noinline)) int64_t stamped(void (*fn)()) {
  take_stamp(&g_before);
  fn();
  take_stamp(&g_after);
  return instructions_between(g_before, g_after);
}
void nothing() {}

int64_t counted(void (*fn)()) {
  static int64_t empty = -1;
  if (empty < 0) empty = stamped(nothing);
  return stamped(fn) - empty;
}

// ---- Inputs -------------------------------------------------------------------------------------

constexpr int32_t kHeight = 120, kWidth = 160, kPixels = kHeight * kWidth;
constexpr uint16_t kKey = 100;

uint32_t g_seed = 2026;
uint32_t random_word() {
  g_seed ^= g_seed << 13, g_seed ^= g_seed >> 17, g_seed ^= g_seed << 5;
  return g_seed;
}
int32_t random_below(int32_t n) {
  return static_cast<int32_t>(random_word() % static_cast<uint32_t>(n));
}

uint8_t g_picture[kPixels];  // random bytes
uint8_t g_keyed[kPixels];    // random bytes, a fifth of them the key
uint8_t g_mask[kPixels];     // 1, with a 32 x 30 hole of 0 (5 % of the pixels)
uint8_t g_out[kPixels];
uint32_t g_hist[256];
uint8_t g_mean;

void make_inputs() {
  for (int32_t i = 0; i < kPixels; ++i) {
    g_picture[i] = static_cast<uint8_t>(random_word() >> 24);
    const uint8_t other = static_cast<uint8_t>(random_word() >> 24);
    g_keyed[i] = random_below(5) == 0 ? kKey : other == kKey ? kKey + 1 : other;
    g_mask[i] = 1;
  }
  for (int32_t y = 45; y < 75; ++y) memset(g_mask + y * kWidth + 64, 0, 32);
}

void report(const char *name, int64_t instructions, int64_t units) {
  printf("count %s %lld %lld\n", name, static_cast<long long>(instructions),
         static_cast<long long>(units));
}

// ---- Whole-picture routines --------------------------------------------------------------------

struct PictureCase {
  const char *name;
  void (*run)();
  void (*prepare)();  // restores what the previous call changed, outside the count
};

void restore_output() {
  memcpy(g_out, g_picture, kPixels);
}

const PictureCase kPictureCases[] = {
    {"histogram", [] { kel_image_histogram(g_picture, kHeight, kWidth, g_hist); }, nullptr},
    {"histogram_n/4", [] { kel_image_histogram_n(g_picture, kHeight, kWidth, 4, g_hist); },
     nullptr},
    {"var", [] { kel_image_var(g_picture, kHeight, kWidth, &g_mean); }, nullptr},
    {"std", [] { kel_image_std(g_picture, kHeight, kWidth, &g_mean); }, nullptr},
    {"brighten/37", [] { kel_image_brighten(g_picture, kHeight, kWidth, 37, g_out); }, nullptr},
    {"darken/37", [] { kel_image_darken(g_picture, kHeight, kWidth, 37, g_out); }, nullptr},
    {"get_mask", [] { kel_get_mask(g_keyed, kHeight, kWidth, kKey, g_out); }, nullptr},
    {"paste/no-key",
     [] { kel_image_draw_image(g_out, kHeight, kWidth, g_keyed, kHeight, kWidth, 0, 0, 256); },
     restore_output},
    {"paste/key-20",
     [] { kel_image_draw_image(g_out, kHeight, kWidth, g_keyed, kHeight, kWidth, 0, 0, kKey); },
     restore_output},
    {"blend/no-key",
     [] { kel_image_blend_image(g_out, kHeight, kWidth, g_keyed, kHeight, kWidth, 0, 0, 256); },
     restore_output},
    {"blend/key-20",
     [] { kel_image_blend_image(g_out, kHeight, kWidth, g_keyed, kHeight, kWidth, 0, 0, kKey); },
     restore_output},
    {"mask_image/5", [] { kel_mask_image(g_picture, kHeight, kWidth, g_mask, g_out); }, nullptr},
};

// ---- Rotations, per canvas pixel ---------------------------------------------------------------

constexpr uint8_t kAngle = 20;
uint8_t *g_canvas;
int32_t g_canvas_height, g_canvas_width, g_offset_y, g_offset_x;

void count_rotation(const char *name, void (*rotate)()) {
  const int64_t n = counted(rotate);
  report(name, n, int64_t{g_canvas_height} * g_canvas_width);
  free(g_canvas);
}

void count_rotations() {
  count_rotation("rotate", [] {
    kel_image_rotate(g_picture, kHeight, kWidth, kAngle, &g_canvas, &g_canvas_height,
                     &g_canvas_width, &g_offset_y, &g_offset_x);
  });
  count_rotation("rotate_int8", [] {
    kel_image_rotate_int8(reinterpret_cast<const int8_t *>(g_picture), kHeight, kWidth, kAngle,
                          reinterpret_cast<int8_t **>(&g_canvas), &g_canvas_height, &g_canvas_width,
                          &g_offset_y, &g_offset_x);
  });
  count_rotation("rotate_int8_nn", [] {
    kel_image_rotate_int8_nn(reinterpret_cast<const int8_t *>(g_picture), kHeight, kWidth, kAngle,
                             reinterpret_cast<int8_t **>(&g_canvas), &g_canvas_height,
                             &g_canvas_width, &g_offset_y, &g_offset_x);
  });
}

// ---- Figures, per pixel written ----------------------------------------------------------------

constexpr int kFigures = 64;
constexpr uint8_t kBackground = 17, kColour = 200;  // neither is the other's complement
struct Figure {
  int32_t a[7];
};
Figure g_figure;

// Random figures inside the raster, so that every pixel of a figure is a pixel written.
Figure random_figure(char kind) {
  Figure f{};
  int32_t *a = f.a;
  if (kind == 'l' || kind == 't') {
    for (int k = 0; k < 6; k += 2) a[k] = random_below(kWidth), a[k + 1] = random_below(kHeight);
  } else if (kind == 'r') {
    a[2] = 2 + random_below(47), a[3] = 2 + random_below(47);
    a[0] = random_below(kWidth - a[2]), a[1] = random_below(kHeight - a[3]);
  } else if (kind == 'c') {
    a[0] = 3 + random_below(38);
    a[1] = a[0] / 2 + random_below(kWidth - a[0]), a[2] = a[0] / 2 + random_below(kHeight - a[0]);
  } else {  // a number of one to six digits, a third of them negative, two to three leading zeros
    static const int32_t kLimits[] = {10, 100, 1000, 10000, 100000, 1000000};
    a[0] = random_below(kLimits[random_below(6)]) * (random_below(3) == 0 ? -1 : 1);
    a[1] = random_below(4);
    a[2] = 1 + random_below(kWidth - 50), a[3] = 1 + random_below(kHeight - 10);
  }
  return f;
}

void count_figures(const char *name, char kind, void (*draw)()) {
  int64_t instructions = 0, written = 0;
  for (int k = 0; k < kFigures; ++k) {
    g_figure = random_figure(kind);
    memset(g_out, kBackground, kPixels);
    instructions += counted(draw);
    for (uint8_t v : g_out) written += v != kBackground;
  }
  report(name, instructions, written);
}

void count_drawing() {
  count_figures("line", 'l', [] {
    const int32_t *a = g_figure.a;
    kel_image_draw_line(g_out, kHeight, kWidth, a[0], a[1], a[2], a[3], kColour);
  });
  count_figures("triangle", 't', [] {
    const int32_t *a = g_figure.a;
    kel_image_draw_triangle(g_out, kHeight, kWidth, a[0], a[1], a[2], a[3], a[4], a[5], kColour);
  });
  count_figures("rectangle", 'r', [] {
    const int32_t *a = g_figure.a;
    kel_image_draw_rectangle(g_out, kHeight, kWidth, a[0], a[1], static_cast<uint32_t>(a[2]),
                             static_cast<uint32_t>(a[3]), kColour);
  });
  count_figures("circle", 'c', [] {
    const int32_t *a = g_figure.a;
    kel_image_draw_circle(g_out, kHeight, kWidth, static_cast<uint32_t>(a[0]), a[1], a[2], kColour);
  });
  count_figures("number", 'n', [] {
    const int32_t *a = g_figure.a;
    kel_image_draw_number(g_out, kHeight, kWidth, a[0], static_cast<uint8_t>(a[1]), a[2], a[3],
                          kColour);
  });
}

// Stamps around straight runs of known length must differ by exactly that length; a failure
// here means the clock is not read the way this file assumes.
template <int N>
void run_of_nops() {
  __asm__ volatile(".rept %c0\n\tnop\n\t.endr" ::"i"(N));
}
bool clock_checks() {
  const int64_t zero = counted(run_of_nops<0>);
  return counted(run_of_nops<1>) - zero == 1 && counted(run_of_nops<17>) - zero == 17 &&
         counted(run_of_nops<40>) - zero == 40 && counted(run_of_nops<333>) - zero == 333;
}

}  // namespace

int main() {
  const uint32_t part = (*reinterpret_cast<volatile uint32_t *>(0xE000ED00) >> 4) & 0xFFF;
  if (part == 0xD22) g_tick_quarters = 125;  // a Cortex-M55: the MPS3-AN547's 32 MHz
  // SysTick from its top, on the core's clock, without interrupts.
  kSysTick[1] = kTickMask;
  kSysTick[2] = 0;
  kSysTick[0] = 5;
  // The counter reads 0 until its first reload; a first stamp lets that pass.
  take_stamp(&g_before);
  if (!clock_checks()) {
    printf("error: stamps around runs of nops do not count them\n");
    return 3;
  }
  make_inputs();
  for (const PictureCase &c : kPictureCases) {
    if (c.prepare) c.prepare();
    report(c.name, counted(c.run), kPixels);
  }
  count_rotations();
  count_drawing();
  return 0;
}
