// The library's routines applied to whole pictures. Each function checks the sizes that the
// routine's contract asks of its caller and throws InputError instead of calling outside them.
#ifndef KELIMG_OPERATIONS_H
#define KELIMG_OPERATIONS_H

#include <array>
#include <cstdint>
#include <string>
#include <vector>

#include "picture.h"

namespace kelimg {

// The largest coordinate, offset or figure size the tool passes on. Far beyond any picture
// side, and small enough that no sum the routines form can leave 32 bits.
constexpr int32_t kCoordinateLimit = 1000000;

struct Statistics {
  std::array<uint32_t, 256> histogram{};
  uint32_t count = 0;
  uint8_t mean = 0;
  uint16_t variance = 0;
  uint8_t std_dev = 0;
  // The library sums in 32 bits; on large pictures of extreme values the sums wrap and the
  // figures above are those of the wrapped sums. These say whether that happened.
  bool mean_wrapped = false;
  bool variance_wrapped = false;
};

// Needs at least one pixel and fewer than 2^31.
Statistics statistics(const Picture &picture);

// The histogram of the top `bits` bits of every pixel, 2^bits bins (bits 0 to 8).
std::vector<uint32_t> reduced_histogram(const Picture &picture, uint32_t bits);

// The histogram drawn with the library's own figures: bars, an axis with numbered ticks, the
// mean as a dashed line and mean +- standard deviation as a bracket above the bars.
Picture plot_histogram(const Statistics &stats);

enum class Resampling {
  bilinear,       // kel_image_rotate: unsigned pixels, 255 where uncovered
  bilinear_int8,  // kel_image_rotate_int8: pixels shifted to -128..127 and back, 128 uncovered
  nearest_int8,   // kel_image_rotate_int8_nn: likewise, 0 uncovered (the marker -128)
};

struct Rotated {
  Picture canvas;
  int32_t offset_x = 0;
  int32_t offset_y = 0;
};

// Angle in 1/256 turns, clockwise. Needs sides below 16384.
Rotated rotate(const Picture &picture, uint8_t angle, Resampling resampling);

// Degrees to the library's 1/256 turns, rounded to the nearest unit, modulo a full turn.
uint8_t degrees_to_angle(double degrees);

Picture brighten(const Picture &picture, uint32_t percent);
Picture darken(const Picture &picture, uint32_t percent);

// 0 where the picture holds key, 1 elsewhere; with `viewable` the 1s become 255.
Picture mask(const Picture &picture, int32_t key, bool viewable);

// Fills the pixels where hole_mask is 0 from the values around them. Needs sides up to 65528
// and a mask of the picture's size.
Picture fill(const Picture &picture, const Picture &hole_mask);

// Pastes or blends `overlay` with its top-left pixel at (x, y); overlay pixels equal to key are
// transparent, a key above 255 makes none transparent. Needs overlay sides up to 65535.
enum class Compose { paste, blend };
Picture compose(const Picture &base, const Picture &overlay, int32_t x, int32_t y, uint16_t key,
                Compose how);

}  // namespace kelimg

#endif  // KELIMG_OPERATIONS_H
