#include <benchmark/benchmark.h>

#include <cstdint>
#include <random>
#include <vector>

#include "kel_images.h"

namespace {

// Arguments: height, width. A VGA frame and a 3-megapixel one, of uniformly random pixels.
void image_sizes(benchmark::internal::Benchmark *bench) {
  bench->Args({480, 640})->Args({1536, 2048});
}

struct RandomImage {
  int32_t height, width;
  std::vector<uint8_t> pixels;

  explicit RandomImage(const benchmark::State &state)
      : height(static_cast<int32_t>(state.range(0))),
        width(static_cast<int32_t>(state.range(1))),
        pixels(static_cast<size_t>(height) * static_cast<size_t>(width)) {
    std::mt19937 rng(42);
    for (uint8_t &p : pixels) p = static_cast<uint8_t>(rng());
  }

  // One pixel is one item and one byte.
  void report(benchmark::State &state) const {
    const int64_t pixel_count = static_cast<int64_t>(pixels.size());
    state.SetItemsProcessed(state.iterations() * pixel_count);
    state.SetBytesProcessed(state.iterations() * pixel_count);
  }
};

void BM_ImageHistogram(benchmark::State &state) {
  const RandomImage image(state);
  uint32_t hist[256];
  for (auto _ : state) {
    kel_image_histogram(image.pixels.data(), image.height, image.width, hist);
    benchmark::DoNotOptimize(hist);
    benchmark::ClobberMemory();
  }
  image.report(state);
}
BENCHMARK(BM_ImageHistogram)->Apply(image_sizes);

void BM_ImageHistogram4Bits(benchmark::State &state) {
  const RandomImage image(state);
  uint32_t hist[16];
  for (auto _ : state) {
    kel_image_histogram_n(image.pixels.data(), image.height, image.width, 4, hist);
    benchmark::DoNotOptimize(hist);
    benchmark::ClobberMemory();
  }
  image.report(state);
}
BENCHMARK(BM_ImageHistogram4Bits)->Apply(image_sizes);

void BM_ImageVar(benchmark::State &state) {
  const RandomImage image(state);
  uint8_t mean = 0;
  for (auto _ : state) {
    benchmark::DoNotOptimize(kel_image_var(image.pixels.data(), image.height, image.width, &mean));
    benchmark::DoNotOptimize(mean);
  }
  image.report(state);
}
BENCHMARK(BM_ImageVar)->Apply(image_sizes);

void BM_ImageStd(benchmark::State &state) {
  const RandomImage image(state);
  uint8_t mean = 0;
  for (auto _ : state) {
    benchmark::DoNotOptimize(kel_image_std(image.pixels.data(), image.height, image.width, &mean));
    benchmark::DoNotOptimize(mean);
  }
  image.report(state);
}
BENCHMARK(BM_ImageStd)->Apply(image_sizes);

}  // namespace
