// Our default blur and enlargement at the sizes the masked fill gives them on a 3-megapixel
// image: the whole image into a separate raster, the block grid in place, and the grid
// enlarged by 8 onto the whole image. The whole image blurred in place as well, the two-pass
// path, for a comparison with the one-sweep blur into a separate raster.
#include <benchmark/benchmark.h>

#include <cstdint>
#include <random>
#include <vector>

#include "kel_outside.h"

namespace {

using Bytes = std::vector<uint8_t>;

Bytes random_raster(size_t count) {
  std::mt19937 generator(11);
  Bytes pixels(count);
  for (uint8_t &p : pixels) p = static_cast<uint8_t>(generator());
  return pixels;
}

// Arguments: height, width, and 1 to blur in place. Bytes are the pixels blurred.
void BM_Blur(benchmark::State &state) {
  const auto height = static_cast<uint16_t>(state.range(0));
  const auto width = static_cast<uint16_t>(state.range(1));
  const bool in_place = state.range(2) != 0;
  const Bytes in = random_raster(size_t{height} * width);
  Bytes out = in;
  for (auto _ : state) {
    kel_blur_uint8(in_place ? out.data() : in.data(), height, width, out.data());
    benchmark::DoNotOptimize(out.data());
  }
  state.SetBytesProcessed(static_cast<int64_t>(state.iterations()) * height * width);
}

// Arguments: input height, input width, factor. Bytes are the output pixels written.
void BM_ScaleUp(benchmark::State &state) {
  const auto in_height = static_cast<uint16_t>(state.range(0));
  const auto in_width = static_cast<uint16_t>(state.range(1));
  const auto factor = static_cast<uint16_t>(state.range(2));
  const auto out_height = static_cast<uint16_t>(in_height * factor);
  const auto out_width = static_cast<uint16_t>(in_width * factor);
  const Bytes in = random_raster(size_t{in_height} * in_width);
  Bytes out(size_t{out_height} * out_width);
  for (auto _ : state) {
    kel_scale_up_bilinear_uint8(in.data(), in_height, in_width, factor, out.data(), out_height,
                                out_width);
    benchmark::DoNotOptimize(out.data());
  }
  state.SetBytesProcessed(static_cast<int64_t>(state.iterations()) * out_height * out_width);
}

}  // namespace

BENCHMARK(BM_Blur)
    ->ArgNames({"h", "w", "in_place"})
    ->Args({1536, 2048, 0})
    ->Args({192, 256, 1})
    ->Args({1536, 2048, 1});
BENCHMARK(BM_ScaleUp)->ArgNames({"h", "w", "factor"})->Args({192, 256, 8})->Args({60, 80, 3});
