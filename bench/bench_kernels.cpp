// Every kernel of every table this machine can run, on the rows the routines hand it: a 640-pixel
// image row, a 400-pixel sprite row (a fifth of it transparent for the keyed rows) and a run of a
// rotated canvas row. Named kernel/TABLE/row, so that --benchmark_filter picks a kernel or a table
// and the tables of one kernel sit side by side. The plain table is timed too: it is what the
// other tables are measured against, and what builds without vectors run.
#include <benchmark/benchmark.h>

#include <cstdint>
#include <random>
#include <string>
#include <vector>

#include "kel_outside.h"
#include "kernels.h"
#if KEL_USE_HIGHWAY && !defined(HWY_COMPILE_ONLY_STATIC)
#include <hwy/targets.h>
#endif

namespace {

using Bytes = std::vector<uint8_t>;

Bytes random_bytes(size_t count, uint8_t key) {
  std::mt19937 generator(11);
  Bytes bytes(count);
  for (uint8_t &b : bytes) {
    const auto r = static_cast<uint8_t>(generator());
    b = r % 5 == 0 ? key : static_cast<uint8_t>(r | 1);
  }
  return bytes;
}

constexpr uint8_t kKey = 0;

// A row of `count` pixels through one table's kernel and the plain body after it, as the
// routines run it.
template <typename Call>
void time_row(benchmark::State &state, size_t count, Call call) {
  const Bytes in = random_bytes(count, kKey);
  Bytes out = random_bytes(count, 9);
  for (auto _ : state) {
    call(in.data(), count, out.data());
    benchmark::DoNotOptimize(out.data());
    benchmark::ClobberMemory();
  }
  state.SetBytesProcessed(static_cast<int64_t>(state.iterations() * count));
}

void register_rows(const kel::Kernels *k) {
  const std::string table = k->name;
  struct RowSize {
    const char *name;
    size_t count;
  };
  for (const RowSize size : {RowSize{"640", 640}, RowSize{"sprite400", 400}}) {
    const std::string suffix = "/" + table + "/" + size.name;
    const size_t count = size.count;
    const auto add = [&](const char *kernel, auto call) {
      benchmark::RegisterBenchmark((std::string(kernel) + suffix).c_str(),
                                   [=](benchmark::State &state) { time_row(state, count, call); });
    };
    add("brighten", [k](const uint8_t *in, size_t n, uint8_t *out) {
      kel::run_row(&kel::Kernels::brighten, *k, in, n, uint16_t{37}, out);
    });
    add("darken", [k](const uint8_t *in, size_t n, uint8_t *out) {
      kel::run_row(&kel::Kernels::darken, *k, in, n, uint16_t{37}, out);
    });
    add("mask", [k](const uint8_t *in, size_t n, uint8_t *out) {
      kel::run_row(&kel::Kernels::mask, *k, in, n, kKey, out);
    });
    add("copy", [k](const uint8_t *in, size_t n, uint8_t *out) {
      kel::run_row(&kel::Kernels::copy, *k, in, n, out);
    });
    add("blend", [k](const uint8_t *in, size_t n, uint8_t *out) {
      kel::run_row(&kel::Kernels::blend, *k, in, n, out);
    });
    add("paste_keyed", [k](const uint8_t *in, size_t n, uint8_t *out) {
      kel::run_row(&kel::Kernels::paste_keyed, *k, in, n, kKey, out);
    });
    add("blend_keyed", [k](const uint8_t *in, size_t n, uint8_t *out) {
      kel::run_row(&kel::Kernels::blend_keyed, *k, in, n, kKey, out);
    });
    add("count_bins_8", [k](const uint8_t *in, size_t n, uint8_t *) {
      uint32_t hist[256] = {};
      const size_t done = k->count_bins(in, n, 8, hist);
      kel::kPlainKernels.count_bins(in + done, n - done, 8, hist);
      benchmark::DoNotOptimize(hist);
    });
    add("count_bins_4", [k](const uint8_t *in, size_t n, uint8_t *) {
      uint32_t hist[16] = {};
      const size_t done = k->count_bins(in, n, 4, hist);
      kel::kPlainKernels.count_bins(in + done, n - done, 4, hist);
      benchmark::DoNotOptimize(hist);
    });
    add("sum_pixels", [k](const uint8_t *in, size_t n, uint8_t *) {
      kel::PixelSums sums{0, 0};
      const size_t done = k->sum_pixels(in, n, &sums);
      kel::kPlainKernels.sum_pixels(in + done, n - done, &sums);
      benchmark::DoNotOptimize(sums);
    });
    add("nonzero_tail", [k](const uint8_t *, size_t n, uint8_t *out) {
      out[0] = 0;  // the row's only zero, at its start: the whole row is searched
      for (size_t i = 1; i < n; ++i) out[i] |= 1;
      const size_t tail = k->nonzero_tail(out, n);
      benchmark::DoNotOptimize(tail + kel::kPlainKernels.nonzero_tail(out, n - tail));
    });
  }
  // A run of 300 canvas pixels across a 400 x 400 source, turned by about 28 degrees.
  const auto add_run = [&](const char *kernel, auto entry) {
    benchmark::RegisterBenchmark(
        (std::string(kernel) + "/" + table + "/run300").c_str(), [=](benchmark::State &state) {
          const Bytes source = random_bytes(400 * 400, 3);
          std::vector<int8_t> out(300);
          const kel::RotationRun run{source.data(), 400,         400,         20 * 16384,
                                     30 * 16384,    tq_cos_(20), tq_sin_(20), 300};
          for (auto _ : state) {
            entry(*k, run, out.data());
            benchmark::DoNotOptimize(out.data());
          }
          state.SetItemsProcessed(static_cast<int64_t>(state.iterations() * run.count));
        });
  };
  const auto finish = [](auto member, const kel::Kernels &chosen, kel::RotationRun run, auto *out) {
    const size_t done = (chosen.*member)(run, out);
    run.x += int64_t{run.step_x} * static_cast<int64_t>(done);
    run.y += int64_t{run.step_y} * static_cast<int64_t>(done);
    run.count -= done;
    (kel::kPlainKernels.*member)(run, out + done);
  };
  add_run("rotate_u8", [finish](const kel::Kernels &t, const kel::RotationRun &r, int8_t *out) {
    finish(&kel::Kernels::rotate_u8, t, r, reinterpret_cast<uint8_t *>(out));
  });
  add_run("rotate_i8", [finish](const kel::Kernels &t, const kel::RotationRun &r, int8_t *out) {
    finish(&kel::Kernels::rotate_i8, t, r, out);
  });
  add_run("rotate_i8_nn", [finish](const kel::Kernels &t, const kel::RotationRun &r, int8_t *out) {
    finish(&kel::Kernels::rotate_i8_nn, t, r, out);
  });
}

// Registers every table's benchmarks before main runs them: the plain table, then each target
// Highway built for that this CPU has.
const bool kRegistered = [] {
  register_rows(&kel::kPlainKernels);
#if KEL_USE_HIGHWAY && !defined(HWY_COMPILE_ONLY_STATIC)
  for (const int64_t target : hwy::SupportedAndGeneratedTargets()) {
    hwy::SetSupportedTargetsForTest(target);
    register_rows(&kel::kernels());
  }
  hwy::SetSupportedTargetsForTest(0);
#else
  if (&kel::kernels() != &kel::kPlainKernels) register_rows(&kel::kernels());
#endif
  return true;
}();

}  // namespace
