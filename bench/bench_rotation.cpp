// The three rotations, canvas allocation and release included, in canvas pixels per second.
#include <benchmark/benchmark.h>

#include <cstdint>
#include <cstdlib>
#include <vector>

#include "kel_images.h"

namespace {

enum class Routine { kBilinear, kBilinearInt8, kNearestInt8 };

struct Rotated {
  void *canvas;
  int64_t pixels;
};

Rotated rotate(Routine routine, const std::vector<uint8_t> &src, int32_t height, int32_t width,
               uint8_t angle) {
  int32_t canvas_height = 0, canvas_width = 0, offset_y = 0, offset_x = 0;
  const int8_t *signed_src = reinterpret_cast<const int8_t *>(src.data());
  void *canvas = nullptr;
  if (routine == Routine::kBilinear) {
    uint8_t *out = nullptr;
    kel_image_rotate(src.data(), static_cast<uint32_t>(height), static_cast<uint32_t>(width), angle,
                     &out, &canvas_height, &canvas_width, &offset_y, &offset_x);
    canvas = out;
  } else {
    int8_t *out = nullptr;
    if (routine == Routine::kBilinearInt8) {
      kel_image_rotate_int8(signed_src, static_cast<uint32_t>(height), static_cast<uint32_t>(width),
                            angle, &out, &canvas_height, &canvas_width, &offset_y, &offset_x);
    } else {
      kel_image_rotate_int8_nn(signed_src, height, width, angle, &out, &canvas_height,
                               &canvas_width, &offset_y, &offset_x);
    }
    canvas = out;
  }
  return {canvas, int64_t{canvas_height} * canvas_width};
}

// Arguments: source height, width, angle.
template <Routine kRoutine>
void BM_Rotate(benchmark::State &state) {
  const auto height = static_cast<int32_t>(state.range(0));
  const auto width = static_cast<int32_t>(state.range(1));
  const auto angle = static_cast<uint8_t>(state.range(2));
  std::vector<uint8_t> src(static_cast<size_t>(height) * static_cast<size_t>(width));
  uint32_t seed = 1;
  for (uint8_t &v : src) {
    seed = seed * 1664525u + 1013904223u;
    v = static_cast<uint8_t>(seed >> 24);
  }
  int64_t canvas_pixels = 0;
  for (auto _ : state) {
    const Rotated rotated = rotate(kRoutine, src, height, width, angle);
    benchmark::DoNotOptimize(rotated.canvas);
    benchmark::ClobberMemory();
    std::free(rotated.canvas);
    canvas_pixels = rotated.pixels;
  }
  state.SetItemsProcessed(state.iterations() * canvas_pixels);
}

void RotationSizes(benchmark::internal::Benchmark *b) {
  b->ArgNames({"height", "width", "angle"});
  for (int64_t angle : {20, 32}) {
    b->Args({480, 640, angle});
    b->Args({1536, 2048, angle});
  }
  b->Unit(benchmark::kMicrosecond);
}

BENCHMARK_TEMPLATE(BM_Rotate, Routine::kBilinear)->Apply(RotationSizes);
BENCHMARK_TEMPLATE(BM_Rotate, Routine::kBilinearInt8)->Apply(RotationSizes);
BENCHMARK_TEMPLATE(BM_Rotate, Routine::kNearestInt8)->Apply(RotationSizes);

}  // namespace
