// Point operations, paste, blend and the masked fill on VGA and 3-megapixel images.
#include <benchmark/benchmark.h>

#include <cmath>
#include <cstdint>
#include <random>
#include <vector>

#include "kel_images.h"

namespace {

using Bytes = std::vector<uint8_t>;

// A gradient with some noise, so that neither the table nor the key test sees one value only.
Bytes test_image(size_t height, size_t width) {
  std::mt19937 generator(7);
  std::uniform_int_distribution<int> noise(0, 31);
  Bytes pixels(height * width);
  for (size_t y = 0; y < height; ++y) {
    for (size_t x = 0; x < width; ++x) {
      pixels[y * width + x] =
          static_cast<uint8_t>((x + y) * 200 / (height + width) + noise(generator));
    }
  }
  return pixels;
}

int64_t bytes_per_run(const benchmark::State &state, int64_t pixels) {
  return static_cast<int64_t>(state.iterations()) * pixels;
}

// The three point operations share their setup: one pass from a source into an output of the
// same size.
template <typename Operation>
void run_point_operation(benchmark::State &state, Operation operation) {
  const uint32_t height = static_cast<uint32_t>(state.range(0));
  const uint32_t width = static_cast<uint32_t>(state.range(1));
  const Bytes src = test_image(height, width);
  Bytes out(src.size());
  for (auto _ : state) {
    operation(src.data(), height, width, out.data());
    benchmark::DoNotOptimize(out.data());
  }
  state.SetBytesProcessed(bytes_per_run(state, int64_t{height} * width));
}

void BM_Brighten(benchmark::State &state) {
  run_point_operation(state, [](const uint8_t *src, uint32_t h, uint32_t w, uint8_t *dst) {
    kel_image_brighten(src, h, w, 37, dst);
  });
}

void BM_Darken(benchmark::State &state) {
  run_point_operation(state, [](const uint8_t *src, uint32_t h, uint32_t w, uint8_t *dst) {
    kel_image_darken(src, h, w, 37, dst);
  });
}

void BM_GetMask(benchmark::State &state) {
  run_point_operation(state, [](const uint8_t *src, uint32_t h, uint32_t w, uint8_t *mask) {
    kel_get_mask(src, h, w, 100, mask);
  });
}

// A 400 x 300 source placed inside the destination; bytes are the source pixels composited.
constexpr uint16_t kSourceHeight = 300;
constexpr uint16_t kSourceWidth = 400;

template <void (*Composite)(uint8_t *, int32_t, int32_t, const uint8_t *, uint16_t, uint16_t,
                            int32_t, int32_t, uint16_t)>
void BM_Composite(benchmark::State &state) {
  const int32_t height = static_cast<int32_t>(state.range(0));
  const int32_t width = static_cast<int32_t>(state.range(1));
  const uint16_t key = static_cast<uint16_t>(state.range(2));
  Bytes dst = test_image(static_cast<size_t>(height), static_cast<size_t>(width));
  const Bytes src = test_image(kSourceHeight, kSourceWidth);
  for (auto _ : state) {
    Composite(dst.data(), height, width, src.data(), kSourceHeight, kSourceWidth, 37, 29, key);
    benchmark::DoNotOptimize(dst.data());
  }
  state.SetBytesProcessed(bytes_per_run(state, int64_t{kSourceHeight} * kSourceWidth));
}

// About 5 % of the image in five round holes, the rest kept.
void BM_MaskImage(benchmark::State &state) {
  const uint16_t height = static_cast<uint16_t>(state.range(0));
  const uint16_t width = static_cast<uint16_t>(state.range(1));
  const Bytes src = test_image(height, width);
  Bytes mask(src.size(), 1);
  const double radius = std::sqrt(0.01 * height * width / 3.14159265);
  const double centres[5][2] = {{0.2, 0.3}, {0.7, 0.2}, {0.5, 0.55}, {0.25, 0.8}, {0.8, 0.75}};
  for (const auto &centre : centres) {
    const double cx = centre[0] * width, cy = centre[1] * height;
    for (size_t y = 0; y < height; ++y) {
      for (size_t x = 0; x < width; ++x) {
        const double dx = static_cast<double>(x) - cx, dy = static_cast<double>(y) - cy;
        if (dx * dx + dy * dy < radius * radius) mask[y * width + x] = 0;
      }
    }
  }
  Bytes dst(src.size());
  for (auto _ : state) {
    kel_mask_image(src.data(), height, width, mask.data(), dst.data());
    benchmark::DoNotOptimize(dst.data());
  }
  state.SetBytesProcessed(bytes_per_run(state, int64_t{height} * width));
}

void image_sizes(benchmark::internal::Benchmark *bench) {
  bench->Args({480, 640})->Args({1536, 2048});
}

void composite_sizes(benchmark::internal::Benchmark *bench) {
  for (int64_t key : {256, 100}) bench->Args({480, 640, key})->Args({1536, 2048, key});
  bench->ArgNames({"h", "w", "key"});
}

}  // namespace

BENCHMARK(BM_Brighten)->Apply(image_sizes);
BENCHMARK(BM_Darken)->Apply(image_sizes);
BENCHMARK(BM_GetMask)->Apply(image_sizes);
BENCHMARK_TEMPLATE(BM_Composite, kel_image_draw_image)->Apply(composite_sizes);
BENCHMARK_TEMPLATE(BM_Composite, kel_image_blend_image)->Apply(composite_sizes);
BENCHMARK(BM_MaskImage)->Apply(image_sizes);
