// Drawing on a 640 x 480 raster: figures at random positions, some crossing the edges, with a
// fixed seed so that runs compare.
#include <benchmark/benchmark.h>

#include <cstdint>
#include <random>
#include <vector>

#include "kel_images.h"

namespace {

constexpr int32_t kHeight = 480, kWidth = 640;
constexpr size_t kFigures = 1024;

struct Figure {
  int32_t x0, y0, x1, y1, x2, y2;
  uint32_t size_a, size_b;
  int32_t value;
};

// Positions a little beyond the raster on every side, so that clipping is part of the work.
std::vector<Figure> random_figures() {
  std::mt19937 rng(2024);
  std::uniform_int_distribution<int32_t> column(-64, kWidth + 64), row(-64, kHeight + 64);
  std::uniform_int_distribution<uint32_t> size(0, 300);
  std::uniform_int_distribution<int32_t> value(-999999999, 999999999);
  std::vector<Figure> figures(kFigures);
  for (Figure &f : figures) {
    f = {column(rng), row(rng),  column(rng), row(rng),  column(rng),
         row(rng),    size(rng), size(rng),   value(rng)};
  }
  return figures;
}

template <typename Draw>
void run(benchmark::State &state, Draw draw) {
  const std::vector<Figure> figures = random_figures();
  std::vector<uint8_t> raster(size_t{kHeight} * kWidth, 0);
  size_t next = 0;
  for (auto _ : state) {
    draw(raster.data(), figures[next]);
    next = (next + 1) % kFigures;
    benchmark::ClobberMemory();
  }
  state.SetItemsProcessed(state.iterations());
}

void BM_DrawLine(benchmark::State &state) {
  run(state, [](uint8_t *buf, const Figure &f) {
    kel_image_draw_line(buf, kHeight, kWidth, f.x0, f.y0, f.x1, f.y1, 255);
  });
}

void BM_DrawTriangle(benchmark::State &state) {
  run(state, [](uint8_t *buf, const Figure &f) {
    kel_image_draw_triangle(buf, kHeight, kWidth, f.x0, f.y0, f.x1, f.y1, f.x2, f.y2, 255);
  });
}

void BM_DrawRectangle(benchmark::State &state) {
  run(state, [](uint8_t *buf, const Figure &f) {
    kel_image_draw_rectangle(buf, kHeight, kWidth, f.x0, f.y0, f.size_a, f.size_b, 255);
  });
}

void BM_DrawCircle(benchmark::State &state) {
  run(state, [](uint8_t *buf, const Figure &f) {
    kel_image_draw_circle(buf, kHeight, kWidth, f.size_a, f.x0, f.y0, 255);
  });
}

void BM_DrawNumber(benchmark::State &state) {
  run(state, [](uint8_t *buf, const Figure &f) {
    kel_image_draw_number(buf, kHeight, kWidth, f.value, 1, f.x0, f.y0, 255);
  });
}

// Lines whose end points span the whole 32-bit range: the work is only the part inside.
void BM_DrawHugeLine(benchmark::State &state) {
  run(state, [](uint8_t *buf, const Figure &f) {
    kel_image_draw_line(buf, kHeight, kWidth, INT32_MIN, f.y0, INT32_MAX, f.y1 + 7, 255);
  });
}

BENCHMARK(BM_DrawLine);
BENCHMARK(BM_DrawTriangle);
BENCHMARK(BM_DrawRectangle);
BENCHMARK(BM_DrawCircle);
BENCHMARK(BM_DrawNumber);
BENCHMARK(BM_DrawHugeLine);

}  // namespace
