// Every routine run from several threads at once, on private outputs and one shared read-only
// source, with our outside functions: each thread's results must equal a single-threaded run.
// Built under ThreadSanitizer (the tsan preset) this also shows that no call touches shared
// state.
#include <gtest/gtest.h>

#include <atomic>
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <functional>
#include <thread>
#include <vector>

#include "kel_images.h"

namespace {

using Bytes = std::vector<uint8_t>;

constexpr int32_t kHeight = 40;
constexpr int32_t kWidth = 48;
constexpr size_t kPixels = size_t{kHeight} * kWidth;

// The one source every thread reads: a gradient with a few holes of value 0 for the fill.
const Bytes &shared_source() {
  static const Bytes source = [] {
    Bytes pixels(kPixels);
    for (size_t i = 0; i < kPixels; ++i) {
      const size_t x = i % kWidth, y = i / kWidth;
      pixels[i] = static_cast<uint8_t>((x * 5 + y * 3 + x * y) & 255);
      if (x > 10 && x < 20 && y > 8 && y < 30) pixels[i] = 0;
    }
    return pixels;
  }();
  return source;
}

const Bytes &shared_mask() {
  static const Bytes mask = [] {
    Bytes m(kPixels);
    kel_get_mask(shared_source().data(), kHeight, kWidth, 0, m.data());
    return m;
  }();
  return mask;
}

void append(Bytes &out, const void *data, size_t n) {
  const uint8_t *bytes = static_cast<const uint8_t *>(data);
  out.insert(out.end(), bytes, bytes + n);
}

template <typename T>
void append_value(Bytes &out, T value) {
  append(out, &value, sizeof value);
}

// One job per family: from the iteration number it picks its arguments, calls the routines and
// returns everything they produced.
using Job = std::function<Bytes(int)>;

Bytes image_buffer_job(int i) {
  Bytes out;
  kel_image *image = kel_image_create_ex(5 + i % 7, 3 + i % 5, 1 + i % 3, 24 + i % 4);
  kel_image_clear(image);
  *kel_image_ptr(image, i % 5, i % 3) = static_cast<uint8_t>(i);
  append_value(out, kel_image_offset(image, i % 5, i % 3));
  append(out, image->data, size_t(image->height) * size_t(image->stride));
  kel_image_delete(image);
  Bytes raster(kPixels, 9);
  uint8_t *rows[kHeight];
  kel_images_1D_to_2D(raster.data(), kHeight, kWidth, rows);
  for (int k = 0; k < 64; ++k) {
    kel_set_pixel(raster.data(), kHeight, kWidth, uint32_t(i * 7 + k) % 50, uint16_t(i * 3 + k * 5),
                  uint8_t(k));
  }
  append_value(out, rows[kHeight - 1] - raster.data());
  append(out, raster.data(), raster.size());
  return out;
}

Bytes statistics_job(int i) {
  const uint8_t *src = shared_source().data();
  const int32_t rows = 1 + i % kHeight;
  Bytes out;
  uint32_t hist[256], reduced[256];
  kel_image_histogram(src, rows, kWidth, hist);
  kel_image_histogram_n(src, rows, kWidth, uint32_t(i % 9), reduced);
  const uint32_t count = uint32_t(rows) * kWidth;
  const uint8_t mean = kel_hist_mean(hist, count);
  append_value(out, mean);
  append_value(out, kel_hist_var(hist, mean, count));
  append_value(out, kel_hist_std(hist, mean, count));
  uint8_t mean_var = 0, mean_std = 0;
  append_value(out, kel_image_var(src, rows, kWidth, &mean_var));
  append_value(out, kel_image_std(src, rows, kWidth, &mean_std));
  append_value(out, mean_var);
  append_value(out, mean_std);
  append(out, hist, sizeof hist);
  append(out, reduced, sizeof(uint32_t) << (i % 9));
  return out;
}

Bytes rotation_job(int i) {
  const uint8_t *src = shared_source().data();
  const int8_t *signed_src = reinterpret_cast<const int8_t *>(src);
  const uint8_t angle = static_cast<uint8_t>(i * 37);
  Bytes out;
  int32_t h = 0, w = 0, oy = 0, ox = 0;
  uint8_t *canvas = nullptr;
  kel_image_rotate(src, kHeight, kWidth, angle, &canvas, &h, &w, &oy, &ox);
  append_value(out, h + w * 3 + oy * 5 + ox * 7);
  append(out, canvas, size_t(h) * size_t(w));
  std::free(canvas);
  int8_t *signed_canvas = nullptr;
  kel_image_rotate_int8(signed_src, kHeight, kWidth, angle, &signed_canvas, &h, &w, &oy, &ox);
  append(out, signed_canvas, size_t(h) * size_t(w));
  std::free(signed_canvas);
  kel_image_rotate_int8_nn(signed_src, kHeight, kWidth, angle, &signed_canvas, &h, &w, &oy, &ox);
  append(out, signed_canvas, size_t(h) * size_t(w));
  std::free(signed_canvas);
  return out;
}

Bytes pixel_ops_job(int i) {
  const uint8_t *src = shared_source().data();
  Bytes out, dst(kPixels);
  kel_image_brighten(src, kHeight, kWidth, uint32_t(i * 13 % 120), dst.data());
  append(out, dst.data(), dst.size());
  kel_image_darken(src, kHeight, kWidth, uint32_t(i * 17 % 120), dst.data());
  append(out, dst.data(), dst.size());
  kel_get_mask(src, kHeight, kWidth, i % 256, dst.data());
  append(out, dst.data(), dst.size());
  Bytes canvas(kPixels, uint8_t(i));
  kel_image_draw_image(canvas.data(), kHeight, kWidth, src, 20, 30, i % 40 - 15, i % 30 - 10,
                       uint16_t(i % 2 ? 0 : 300));
  kel_image_blend_image(canvas.data(), kHeight, kWidth, src, kHeight, kWidth, i % 9 - 4, i % 7 - 3,
                        uint16_t(i % 256));
  append(out, canvas.data(), canvas.size());
  kel_mask_image(src, kHeight, kWidth, shared_mask().data(), dst.data());
  append(out, dst.data(), dst.size());
  return out;
}

Bytes drawing_job(int i) {
  Bytes raster(kPixels, uint8_t(i * 3));
  uint8_t *buf = raster.data();
  kel_image_draw_line(buf, kHeight, kWidth, i % 60 - 5, i % 13, 47 - i % 50, 39 - i % 45, 200);
  kel_image_draw_triangle(buf, kHeight, kWidth, i % 10, 3, 40, i % 30, 5, 35, 100);
  kel_image_draw_rectangle(buf, kHeight, kWidth, i % 20 - 4, i % 15 - 3, uint32_t(i % 30),
                           uint32_t(i % 25), 50);
  kel_image_draw_number(buf, kHeight, kWidth, i * 7919 - 50000, uint8_t(i % 4), i % 20 - 3, i % 30,
                        250);
  kel_image_draw_circle(buf, kHeight, kWidth, uint32_t(i % 40), i % 48, i % 40, 25);
  return raster;
}

const Job kJobs[] = {image_buffer_job, statistics_job, rotation_job, pixel_ops_job, drawing_job};
constexpr int kIterations = 48;
constexpr int kThreads = 4;
constexpr int kRounds = 4;

TEST(Concurrency, EveryRoutineGivesItsSingleThreadedResultOnManyThreads) {
  // Built before the threads start, so that they only read them.
  shared_mask();
  std::vector<std::vector<Bytes>> expected;
  for (const Job &job : kJobs) {
    expected.emplace_back();
    for (int i = 0; i < kIterations; ++i) expected.back().push_back(job(i));
  }

  std::atomic<int> mismatches{0};
  std::vector<std::thread> threads;
  for (int t = 0; t < kThreads; ++t) {
    threads.emplace_back([t, &expected, &mismatches] {
      // Each thread walks the jobs in its own order, so different routines overlap in time.
      for (int round = 0; round < kRounds * kIterations; ++round) {
        const int i = (round + t * 11) % kIterations;
        for (size_t j = 0; j < std::size(kJobs); ++j) {
          const size_t job = (j + size_t(t)) % std::size(kJobs);
          if (kJobs[job](i) != expected[job][size_t(i)]) ++mismatches;
        }
      }
    });
  }
  for (std::thread &thread : threads) thread.join();
  EXPECT_EQ(mismatches.load(), 0);
}

}  // namespace
