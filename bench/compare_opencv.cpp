// Times each routine of the library beside the OpenCV call (or the memcpy) that does the same
// job, on the same inputs, one thread, and prints both times and their ratio as a table.
//
// Each side runs in batches of calls long enough to time well; the two sides' batches alternate,
// and each side's figure is the median of its batches, so that a slow moment of the machine
// hits both alike and one outlier moves neither.
#include <algorithm>
#include <chrono>
#include <cinttypes>
#include <cmath>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <functional>
#include <opencv2/core.hpp>
#include <opencv2/imgproc.hpp>
#include <random>
#include <string>
#include <utility>
#include <vector>

#include "kel_images.h"
#if KEL_USE_HIGHWAY
#include <hwy/targets.h>
#endif
#include <sys/wait.h>
#include <unistd.h>

namespace {

using Bytes = std::vector<uint8_t>;
using Clock = std::chrono::steady_clock;

constexpr int kBatches = 15;
constexpr double kBatchSeconds = 0.02;

double seconds_since(Clock::time_point start) {
  return std::chrono::duration<double>(Clock::now() - start).count();
}

// How many calls make a batch of about kBatchSeconds.
int calls_per_batch(const std::function<void()> &call) {
  call();  // warm caches and pages
  int calls = 1;
  for (;;) {
    const Clock::time_point start = Clock::now();
    for (int i = 0; i < calls; ++i) call();
    const double took = seconds_since(start);
    if (took >= kBatchSeconds / 4 || calls >= (1 << 24)) {
      const double wanted = kBatchSeconds / std::max(took / calls, 1e-9);
      return std::max(1, static_cast<int>(wanted));
    }
    calls *= 4;
  }
}

double median(std::vector<double> values) {
  std::sort(values.begin(), values.end());
  return values[values.size() / 2];
}

struct Timing {
  double ours, theirs;  // seconds per call
};

Timing time_both(const std::function<void()> &ours, const std::function<void()> &theirs) {
  const int ours_calls = calls_per_batch(ours);
  const int theirs_calls = calls_per_batch(theirs);
  std::vector<double> ours_times, theirs_times;
  for (int batch = 0; batch < kBatches; ++batch) {
    Clock::time_point start = Clock::now();
    for (int i = 0; i < ours_calls; ++i) ours();
    ours_times.push_back(seconds_since(start) / ours_calls);
    start = Clock::now();
    for (int i = 0; i < theirs_calls; ++i) theirs();
    theirs_times.push_back(seconds_since(start) / theirs_calls);
  }
  return {median(ours_times), median(theirs_times)};
}

// The two sides of a row, timed only when the row is wanted.
struct Pair {
  std::function<void()> ours, theirs;
};

Pair time_pair(std::function<void()> ours, std::function<void()> theirs) {
  return {std::move(ours), std::move(theirs)};
}

// Rows whose routine's name holds this text (all rows when empty), from the command line.
std::string row_filter;

// The comparison's verdict: the ratio of the two times, and whether it meets the goal. A goal
// "at least k times faster" is a ratio theirs / ours >= k; "at most k times memcpy" is
// ours / theirs <= k.
enum class Goal { kFaster, kAtMost };

// The image size the rows below are measured on, printed in front of each routine's name.
struct Size {
  int32_t height, width;
  const char *name;
  bool large;
};

// A goal that differs between the small and the large image.
struct Goals {
  double small, large;
  double at(const Size &size) const { return size.large ? large : small; }
};

void report(const char *routine, const char *against, const Pair &pair, Goal goal, double factor) {
  if (std::string(routine).find(row_filter) == std::string::npos) return;
  const Timing t = time_both(pair.ours, pair.theirs);
  const bool faster = goal == Goal::kFaster;
  const double ratio = faster ? t.theirs / t.ours : t.ours / t.theirs;
  const bool met = faster ? ratio >= factor : ratio <= factor;
  char goal_text[24];
  std::snprintf(goal_text, sizeof goal_text, "%s %g", faster ? ">=" : "<=", factor);
  std::printf("| %-50s | %10.1f | %-30s | %10.1f | %6.2f %-8s | %-7s | %s |\n", routine,
              t.ours * 1e6, against, t.theirs * 1e6, ratio, faster ? "faster" : "x theirs",
              goal_text, met ? "met" : "MISSED");
  std::fflush(stdout);
}

// "routine at W x H".
std::string at_size(const char *routine, const Size &size) {
  return std::string(routine) + " " + size.name;
}

// Uniformly random pixels.
Bytes random_image(size_t pixels, uint32_t seed) {
  std::mt19937 rng(seed);
  Bytes image(pixels);
  for (uint8_t &p : image) p = static_cast<uint8_t>(rng());
  return image;
}

// A gradient with noise, so that a key value comes in bands rather than everywhere.
Bytes gradient_image(size_t height, size_t width) {
  std::mt19937 rng(7);
  std::uniform_int_distribution<int> noise(0, 31);
  Bytes pixels(height * width);
  for (size_t y = 0; y < height; ++y) {
    for (size_t x = 0; x < width; ++x) {
      pixels[y * width + x] = static_cast<uint8_t>((x + y) * 200 / (height + width) + noise(rng));
    }
  }
  return pixels;
}

// About 5 % of the image in five round holes.
Bytes blob_mask(size_t height, size_t width) {
  Bytes mask(height * width, 1);
  const double radius = std::sqrt(0.01 * static_cast<double>(height * width) / 3.14159265);
  const double centres[5][2] = {{0.2, 0.3}, {0.7, 0.2}, {0.5, 0.55}, {0.25, 0.8}, {0.8, 0.75}};
  for (const auto &centre : centres) {
    const double cx = centre[0] * static_cast<double>(width);
    const double cy = centre[1] * static_cast<double>(height);
    for (size_t y = 0; y < height; ++y) {
      for (size_t x = 0; x < width; ++x) {
        const double dx = static_cast<double>(x) - cx, dy = static_cast<double>(y) - cy;
        if (dx * dx + dy * dy < radius * radius) mask[y * width + x] = 0;
      }
    }
  }
  return mask;
}

// A pass that only reads the bytes: libc's search for a byte they do not hold, as fast a read
// of memory as memcpy is a copy. The routines that read the image once are measured against it.
void read_only_pass(const Bytes &zeros) {
  const void *found = std::memchr(zeros.data(), 1, zeros.size());
  asm volatile("" : : "r"(found) : "memory");
}

void compare_statistics(const Size &size) {
  const int32_t height = size.height, width = size.width;
  Bytes image = random_image(size_t{static_cast<uint32_t>(height)} * width, 42);
  const Bytes zeros(image.size(), 0);
  const cv::Mat mat(height, width, CV_8UC1, image.data());
  uint32_t hist[256];
  cv::Mat cv_hist;
  const auto cv_histogram = [&](int bins) {
    const int channels[] = {0};
    const int sizes[] = {bins};
    const float range[] = {0, 256};
    const float *ranges[] = {range};
    cv::calcHist(&mat, 1, channels, cv::Mat(), cv_hist, 1, sizes, ranges);
  };
  report(at_size("kel_image_histogram", size).c_str(), "cv::calcHist 256 bins",
         time_pair([&] { kel_image_histogram(image.data(), height, width, hist); },
                   [&] { cv_histogram(256); }),
         Goal::kFaster, 2.3);
  report(at_size("kel_image_histogram_n, 4 bits", size).c_str(), "cv::calcHist 16 bins",
         time_pair([&] { kel_image_histogram_n(image.data(), height, width, 4, hist); },
                   [&] { cv_histogram(16); }),
         Goal::kFaster, 2.0);

  volatile uint32_t sink = 0;
  uint8_t mean = 0;
  cv::Scalar cv_mean, cv_std;
  report(at_size("kel_image_var", size).c_str(), "cv::meanStdDev",
         time_pair([&] { sink = kel_image_var(image.data(), height, width, &mean); },
                   [&] { cv::meanStdDev(mat, cv_mean, cv_std); }),
         Goal::kFaster, 1.5);
  const auto std_call = [&] { sink = kel_image_std(image.data(), height, width, &mean); };
  report(at_size("kel_image_std", size).c_str(), "cv::meanStdDev",
         time_pair(std_call, [&] { cv::meanStdDev(mat, cv_mean, cv_std); }), Goal::kFaster, 1.5);
  report(at_size("kel_image_std", size).c_str(), "read-only pass (memchr)",
         time_pair(std_call, [&] { read_only_pass(zeros); }), Goal::kAtMost,
         Goals{1.45, 1.1}.at(size));
  (void)sink;
}

void compare_point_operations(const Size &size) {
  const int32_t height = size.height, width = size.width;
  const size_t pixels = size_t{static_cast<uint32_t>(height)} * static_cast<uint32_t>(width);
  const Bytes image = gradient_image(static_cast<size_t>(height), static_cast<size_t>(width));
  // memcpy copies between the very buffers the routines use: the input and output's alignments
  // to each other decide how many loads or stores split a cache line, on both sides alike.
  Bytes out(pixels);
  const auto memcpy_image = [&] { std::memcpy(out.data(), image.data(), pixels); };
  report(at_size("kel_image_brighten", size).c_str(), "memcpy",
         time_pair([&] { kel_image_brighten(image.data(), height, width, 37, out.data()); },
                   memcpy_image),
         Goal::kAtMost, 1.1);
  report(at_size("kel_image_darken", size).c_str(), "memcpy",
         time_pair([&] { kel_image_darken(image.data(), height, width, 37, out.data()); },
                   memcpy_image),
         Goal::kAtMost, 1.1);
  report(
      at_size("kel_get_mask", size).c_str(), "memcpy",
      time_pair([&] { kel_get_mask(image.data(), height, width, 100, out.data()); }, memcpy_image),
      Goal::kAtMost, 1.0);
}

void compare_compositing(const Size &size) {
  const int32_t height = size.height, width = size.width;
  constexpr uint16_t kSourceHeight = 300, kSourceWidth = 400;
  Bytes dst = gradient_image(static_cast<size_t>(height), static_cast<size_t>(width));
  const Bytes src = gradient_image(kSourceHeight, kSourceWidth);
  Bytes copy(src.size());
  const auto memcpy_source = [&] { std::memcpy(copy.data(), src.data(), src.size()); };
  struct Case {
    const char *name;
    void (*routine)(uint8_t *, int32_t, int32_t, const uint8_t *, uint16_t, uint16_t, int32_t,
                    int32_t, uint16_t);
    uint16_t key;
  };
  const Case cases[] = {
      {"kel_image_draw_image, key 256", kel_image_draw_image, 256},
      {"kel_image_draw_image, key 100", kel_image_draw_image, 100},
      {"kel_image_blend_image, key 256", kel_image_blend_image, 256},
      {"kel_image_blend_image, key 100", kel_image_blend_image, 100},
  };
  for (const Case &c : cases) {
    report(at_size(c.name, size).c_str(), "memcpy of the 400 x 300 source",
           time_pair(
               [&] {
                 c.routine(dst.data(), height, width, src.data(), kSourceHeight, kSourceWidth, 37,
                           29, c.key);
               },
               memcpy_source),
           Goal::kAtMost, 1.6);
  }

  const Bytes image = gradient_image(static_cast<size_t>(height), static_cast<size_t>(width));
  const Bytes mask = blob_mask(static_cast<size_t>(height), static_cast<size_t>(width));
  Bytes out(image.size()), image_copy(image.size());
  report(at_size("kel_mask_image, 5 % hole", size).c_str(), "memcpy",
         time_pair(
             [&] {
               kel_mask_image(image.data(), static_cast<uint16_t>(height),
                              static_cast<uint16_t>(width), mask.data(), out.data());
             },
             [&] { std::memcpy(image_copy.data(), image.data(), image.size()); }),
         Goal::kAtMost, 20.0);
}

enum class Rotation { kBilinear, kBilinearInt8, kNearestInt8 };

void compare_rotations(const Size &size) {
  const int32_t height = size.height, width = size.width;
  const Bytes image = random_image(size_t{static_cast<uint32_t>(height)} * width, 1);
  const cv::Mat mat(height, width, CV_8UC1, const_cast<uint8_t *>(image.data()));
  const auto *signed_image = reinterpret_cast<const int8_t *>(image.data());
  const auto h = static_cast<uint32_t>(height), w = static_cast<uint32_t>(width);
  struct Case {
    const char *name;
    const char *against;
    Rotation rotation;
    int interpolation;
    uint8_t angle;
    Goals goals;
  };
  const Case cases[] = {
      {"kel_image_rotate, angle 20",
       "cv::warpAffine INTER_LINEAR",
       Rotation::kBilinear,
       cv::INTER_LINEAR,
       20,
       {6.9, 5.3}},
      {"kel_image_rotate_int8, angle 20",
       "cv::warpAffine INTER_LINEAR",
       Rotation::kBilinearInt8,
       cv::INTER_LINEAR,
       20,
       {6.6, 5.3}},
      {"kel_image_rotate_int8_nn, angle 20",
       "cv::warpAffine INTER_NEAREST",
       Rotation::kNearestInt8,
       cv::INTER_NEAREST,
       20,
       {3.0, 3.0}},
      {"kel_image_rotate, angle 32",
       "cv::warpAffine INTER_LINEAR",
       Rotation::kBilinear,
       cv::INTER_LINEAR,
       32,
       {6.9, 5.3}},
  };
  for (const Case &c : cases) {
    int32_t canvas_height = 0, canvas_width = 0, offset_y = 0, offset_x = 0;
    const auto rotate = [&] {
      void *canvas = nullptr;
      if (c.rotation == Rotation::kBilinear) {
        uint8_t *out = nullptr;
        kel_image_rotate(image.data(), h, w, c.angle, &out, &canvas_height, &canvas_width,
                         &offset_y, &offset_x);
        canvas = out;
      } else {
        int8_t *out = nullptr;
        if (c.rotation == Rotation::kBilinearInt8) {
          kel_image_rotate_int8(signed_image, h, w, c.angle, &out, &canvas_height, &canvas_width,
                                &offset_y, &offset_x);
        } else {
          kel_image_rotate_int8_nn(signed_image, height, width, c.angle, &out, &canvas_height,
                                   &canvas_width, &offset_y, &offset_x);
        }
        canvas = out;
      }
      std::free(canvas);
    };
    rotate();  // learns the canvas size, which OpenCV is given
    // The same turn: the source's centre onto the canvas's centre, 256 units to the full turn.
    const double degrees = c.angle * 360.0 / 256.0;
    cv::Mat turn = cv::getRotationMatrix2D(
        cv::Point2f(static_cast<float>(width) / 2.0f, static_cast<float>(height) / 2.0f), -degrees,
        1);
    turn.at<double>(0, 2) += (canvas_width - width) / 2.0;
    turn.at<double>(1, 2) += (canvas_height - height) / 2.0;
    const cv::Size canvas_size(canvas_width, canvas_height);
    report(at_size(c.name, size).c_str(), c.against,
           time_pair(rotate,
                     [&] {
                       cv::Mat out;  // a new canvas every call, as the routine allocates one
                       cv::warpAffine(mat, out, turn, canvas_size, c.interpolation,
                                      cv::BORDER_CONSTANT, cv::Scalar(255));
                     }),
           Goal::kFaster, c.goals.at(size));
  }
}

// Random figures on a 640 x 480 raster, some crossing its edges; each side draws all of them.
void compare_drawing() {
  constexpr int32_t kRasterHeight = 480, kRasterWidth = 640;
  constexpr size_t kFigures = 1024;
  struct Figure {
    int32_t x0, y0, x1, y1, x2, y2;
    uint32_t size_a, size_b;
    int32_t value;
    std::string text;
  };
  std::mt19937 rng(2024);
  std::uniform_int_distribution<int32_t> column(-64, kRasterWidth + 64);
  std::uniform_int_distribution<int32_t> row(-64, kRasterHeight + 64);
  std::uniform_int_distribution<uint32_t> size(0, 300);
  std::uniform_int_distribution<int32_t> value(-999999999, 999999999);
  std::vector<Figure> figures(kFigures);
  for (Figure &f : figures) {
    f.x0 = column(rng), f.y0 = row(rng), f.x1 = column(rng), f.y1 = row(rng);
    f.x2 = column(rng), f.y2 = row(rng), f.size_a = size(rng), f.size_b = size(rng);
    f.value = value(rng);
    f.text = std::to_string(f.value);  // formatted ahead, so OpenCV's time is drawing only
  }
  Bytes raster(size_t{kRasterHeight} * kRasterWidth, 0);
  cv::Mat mat(kRasterHeight, kRasterWidth, CV_8UC1, raster.data());
  const cv::Scalar white(255);

  const auto each = [&](auto draw) {
    return [&figures, draw] {
      for (const Figure &f : figures) draw(f);
    };
  };
  report("kel_image_draw_line x1024", "cv::line LINE_8",
         time_pair(each([&](const Figure &f) {
                     kel_image_draw_line(raster.data(), kRasterHeight, kRasterWidth, f.x0, f.y0,
                                         f.x1, f.y1, 255);
                   }),
                   each([&](const Figure &f) {
                     cv::line(mat, {f.x0, f.y0}, {f.x1, f.y1}, white, 1, cv::LINE_8);
                   })),
         Goal::kFaster, 2.0);
  report("kel_image_draw_triangle x1024", "3 x cv::line LINE_8",
         time_pair(each([&](const Figure &f) {
                     kel_image_draw_triangle(raster.data(), kRasterHeight, kRasterWidth, f.x0, f.y0,
                                             f.x1, f.y1, f.x2, f.y2, 255);
                   }),
                   each([&](const Figure &f) {
                     cv::line(mat, {f.x0, f.y0}, {f.x1, f.y1}, white, 1, cv::LINE_8);
                     cv::line(mat, {f.x1, f.y1}, {f.x2, f.y2}, white, 1, cv::LINE_8);
                     cv::line(mat, {f.x2, f.y2}, {f.x0, f.y0}, white, 1, cv::LINE_8);
                   })),
         Goal::kFaster, 2.0);
  report("kel_image_draw_rectangle x1024", "cv::rectangle",
         time_pair(each([&](const Figure &f) {
                     kel_image_draw_rectangle(raster.data(), kRasterHeight, kRasterWidth, f.x0,
                                              f.y0, f.size_a, f.size_b, 255);
                   }),
                   each([&](const Figure &f) {
                     cv::rectangle(mat,
                                   cv::Rect(f.x0, f.y0, static_cast<int>(f.size_a),
                                            static_cast<int>(f.size_b)),
                                   white, 1, cv::LINE_8);
                   })),
         Goal::kFaster, 4.0);
  report("kel_image_draw_circle x1024", "cv::circle",
         time_pair(
             each([&](const Figure &f) {
               kel_image_draw_circle(raster.data(), kRasterHeight, kRasterWidth, f.size_a, f.x0,
                                     f.y0, 255);
             }),
             each([&](const Figure &f) {
               cv::circle(mat, {f.x0, f.y0}, static_cast<int>(f.size_a / 2), white, 1, cv::LINE_8);
             })),
         Goal::kFaster, 4.0);
  report("kel_image_draw_number x1024", "cv::putText",
         time_pair(each([&](const Figure &f) {
                     kel_image_draw_number(raster.data(), kRasterHeight, kRasterWidth, f.value, 1,
                                           f.x0, f.y0, 255);
                   }),
                   each([&](const Figure &f) {
                     cv::putText(mat, f.text, {f.x0, f.y0 + 7}, cv::FONT_HERSHEY_PLAIN, 0.6, white,
                                 1, cv::LINE_8);
                   })),
         Goal::kFaster, 4.0);
}

// The OpenCV features above each of our instruction sets, switched off so that both sides run
// the same instructions when the library is pinned to a narrower set.
const char *opencv_features_above(const std::string &target) {
  static const char kAvx512[] =
      "AVX_512F,AVX512_COMMON,AVX512_KNL,AVX512_KNM,AVX512_SKX,AVX512_CNL,AVX512_CLX,AVX512_ICL";
  static const char kAvx2[] =
      "AVX,FP16,AVX2,FMA3,AVX_512F,AVX512_COMMON,AVX512_KNL,AVX512_KNM,AVX512_SKX,AVX512_CNL,"
      "AVX512_CLX,AVX512_ICL";
  static const char kSse4[] =
      "SSE4_1,POPCNT,SSE4_2,AVX,FP16,AVX2,FMA3,AVX_512F,AVX512_COMMON,AVX512_KNL,AVX512_KNM,"
      "AVX512_SKX,AVX512_CNL,AVX512_CLX,AVX512_ICL";
  if (target == "AVX2") return kAvx512;
  if (target == "SSE4") return kAvx2;
  if (target == "SSSE3" || target == "EMU128" || target == "SCALAR") return kSse4;
  return "";
}

void run_tables() {
  std::printf(
      "One thread; times are microseconds per call, the median of %d batches.\n"
      "Each image routine at 640 x 480 and at 2048 x 1536; figures on 640 x 480.\n\n",
      kBatches);
  std::printf("| %-50s | %10s | %-30s | %10s | %-15s | %-7s | %s |\n", "routine", "ours, us",
              "against", "theirs, us", "ratio", "goal", "");
  std::printf("|%s|%s|%s|%s|%s|%s|%s|\n", std::string(52, '-').c_str(),
              std::string(12, '-').c_str(), std::string(32, '-').c_str(),
              std::string(12, '-').c_str(), std::string(17, '-').c_str(),
              std::string(9, '-').c_str(), std::string(8, '-').c_str());
  const Size sizes[] = {{480, 640, "at 640 x 480", false}, {1536, 2048, "at 2048 x 1536", true}};
  for (const Size &size : sizes) {
    compare_statistics(size);
    compare_point_operations(size);
    compare_compositing(size);
    compare_rotations(size);
  }
  compare_drawing();
}

}  // namespace

// compare_opencv [--target NAME|all] [text]: only the rows whose routine's name holds the text;
// with --target, the library pinned to that instruction set (all: each one this CPU has, in turn)
// and OpenCV to the same features. OpenCV reads its switch when it loads, so a pinned run starts
// the program again with it set.
int main(int argc, char **argv) {
  std::string target;
  int arg = 1;
  if (argc > 2 && std::strcmp(argv[1], "--target") == 0) {
    target = argv[2];
    arg = 3;
  }
  if (argc > arg) row_filter = argv[arg];
#if KEL_USE_HIGHWAY
  std::vector<int64_t> targets = hwy::SupportedAndGeneratedTargets();
  if (target == "all") {
    for (const int64_t t : targets) {
      const pid_t child = fork();
      if (child == 0) {
        std::vector<char *> args = {argv[0], const_cast<char *>("--target"),
                                    const_cast<char *>(hwy::TargetName(t))};
        if (argc > arg) args.push_back(argv[arg]);
        args.push_back(nullptr);
        execv("/proc/self/exe", args.data());
        _exit(127);
      }
      int status = 0;
      waitpid(child, &status, 0);
    }
    return 0;
  }
  if (!target.empty()) {
    int64_t chosen = 0;
    for (const int64_t t : targets) {
      if (target == hwy::TargetName(t)) chosen = t;
    }
    if (chosen == 0) {
      std::fprintf(stderr, "compare_opencv: this CPU has no target %s\n", target.c_str());
      return 2;
    }
    const char *features = opencv_features_above(target);
    if (std::getenv("KEL_COMPARE_PINNED") == nullptr) {
      setenv("KEL_COMPARE_PINNED", "1", 1);
      if (*features != 0) setenv("OPENCV_CPU_DISABLE", features, 1);
      execv("/proc/self/exe", argv);
      return 127;
    }
    hwy::SetSupportedTargetsForTest(chosen);
    std::printf("\n### %s (OpenCV without %s)\n\n", target.c_str(),
                *features != 0 ? features : "nothing");
  }
#else
  if (!target.empty()) {
    std::fprintf(stderr, "compare_opencv: built without Highway, no target to pick\n");
    return 2;
  }
#endif
  cv::setNumThreads(1);
  run_tables();
  return 0;
}
