// What the routines that allocate do when malloc fails. The program is linked with
// -Wl,--wrap=malloc (and calloc, free, and the outside functions the routines call), so every
// allocation the library makes passes through the stand-ins below, which can fail the Nth one
// and keep track of what is still live. Only a static build can be wrapped this way.
#include <gtest/gtest.h>
#include <sys/mman.h>
#include <unistd.h>

#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <vector>

#include "kel_images.h"
#include "kel_outside.h"

extern "C" {
void *__real_malloc(size_t size);
void *__real_calloc(size_t count, size_t size);
void __real_free(void *pointer);
int32_t __real_tq_cos_(uint8_t angle);
int32_t __real_tq_sin_(uint8_t angle);
void __real_kel_blur_uint8(const uint8_t *in, uint16_t height, uint16_t width, uint8_t *out);
void __real_kel_scale_up_bilinear_uint8(const uint8_t *in, uint16_t in_height, uint16_t in_width,
                                        uint16_t factor, uint8_t *out, uint16_t out_height,
                                        uint16_t out_width);
}

namespace {

// The heap as the library sees it while a check is armed. Single-threaded: GoogleTest runs the
// tests one after another, and nothing else allocates between arm() and disarm() but the call
// under test.
struct Heap {
  bool armed = false;
  int fail_at = -1;  // which armed allocation fails, counted from 0; -1: none
  int allocations = 0;
  static constexpr int kMaxLive = 16;
  void *live[kMaxLive] = {};
  int live_count = 0;

  void arm(int failing) {
    armed = true;
    fail_at = failing;
    allocations = 0;
    live_count = 0;
  }
  void disarm() { armed = false; }

  void *track(void *block) {
    if (block != nullptr && live_count < kMaxLive) live[live_count++] = block;
    return block;
  }
  void forget(void *block) {
    for (int i = 0; i < live_count; ++i) {
      if (live[i] == block) {
        live[i] = live[--live_count];
        return;
      }
    }
  }
};
Heap g_heap;

// Calls of the outside functions, counted while armed.
struct OutsideCalls {
  int cos = 0, sin = 0, blur = 0, scale = 0;
};
OutsideCalls g_calls;

}  // namespace

extern "C" {

void *__wrap_malloc(size_t size) {
  if (!g_heap.armed) return __real_malloc(size);
  if (g_heap.allocations++ == g_heap.fail_at) return nullptr;
  return g_heap.track(__real_malloc(size));
}

void *__wrap_calloc(size_t count, size_t size) {
  if (!g_heap.armed) return __real_calloc(count, size);
  if (g_heap.allocations++ == g_heap.fail_at) return nullptr;
  return g_heap.track(__real_calloc(count, size));
}

void __wrap_free(void *pointer) {
  if (g_heap.armed) g_heap.forget(pointer);
  __real_free(pointer);
}

int32_t __wrap_tq_cos_(uint8_t angle) {
  if (g_heap.armed) ++g_calls.cos;
  return __real_tq_cos_(angle);
}

int32_t __wrap_tq_sin_(uint8_t angle) {
  if (g_heap.armed) ++g_calls.sin;
  return __real_tq_sin_(angle);
}

void __wrap_kel_blur_uint8(const uint8_t *in, uint16_t height, uint16_t width, uint8_t *out) {
  if (g_heap.armed) ++g_calls.blur;
  __real_kel_blur_uint8(in, height, width, out);
}

void __wrap_kel_scale_up_bilinear_uint8(const uint8_t *in, uint16_t in_height, uint16_t in_width,
                                        uint16_t factor, uint8_t *out, uint16_t out_height,
                                        uint16_t out_width) {
  if (g_heap.armed) ++g_calls.scale;
  __real_kel_scale_up_bilinear_uint8(in, in_height, in_width, factor, out, out_height, out_width);
}

}  // extern "C"

namespace {

// What one armed call did: allocations asked for, blocks still live, outside calls made.
struct Seen {
  int allocations, live;
  OutsideCalls calls;
};

// Runs the call with the heap armed to fail allocation `failing` (or none with -1) and reports
// what it did. Nothing of the test itself runs while armed, so a failed expectation cannot
// disturb the count.
template <typename Call>
Seen armed(int failing, Call call) {
  g_calls = OutsideCalls{};
  g_heap.arm(failing);
  call();
  g_heap.disarm();
  return {g_heap.allocations, g_heap.live_count, g_calls};
}

// Memory that faults when touched: a routine that must not read its source gets this one.
struct Untouchable {
  void *page;
  Untouchable() {
    page =
        mmap(nullptr, size_t(sysconf(_SC_PAGESIZE)), PROT_NONE, MAP_PRIVATE | MAP_ANONYMOUS, -1, 0);
  }
  ~Untouchable() { munmap(page, size_t(sysconf(_SC_PAGESIZE))); }
};

TEST(AllocationFailure, WrappingSeesTheLibrarysAllocations) {
  // Guards the other tests: if the wrap did not reach the library they would pass vacuously.
  kel_image *image = nullptr;
  const Seen created = armed(-1, [&] { image = kel_image_create(2, 3, 1); });
  ASSERT_NE(image, nullptr);
  EXPECT_EQ(created.allocations, 1);
  EXPECT_EQ(created.live, 1);
  g_heap.armed = true;  // so that the release is seen
  kel_image_delete(image);
  g_heap.disarm();
  EXPECT_EQ(g_heap.live_count, 0);
}

TEST(AllocationFailure, ImageCreateReturnsNull) {
  kel_image *images[3] = {};
  const Seen seen[3] = {armed(0, [&] { images[0] = kel_image_create_ex(10, 20, 3, 61); }),
                        armed(0, [&] { images[1] = kel_image_create(7, 9, 2); }),
                        armed(0, [&] { images[2] = kel_image_create_ex(0, 0, 0, 0); })};
  for (int i = 0; i < 3; ++i) {
    EXPECT_EQ(images[i], nullptr);
    EXPECT_EQ(seen[i].allocations, 1);
    EXPECT_EQ(seen[i].live, 0);
  }
}

struct RotationOutputs {
  void *canvas = reinterpret_cast<void *>(uintptr_t{0x1234});
  int32_t height = -5, width = -5, offset_y = -5, offset_x = -5;
};

enum class Rotation { kUnsigned, kSigned, kNearest };

void rotate(Rotation kind, const void *src, int32_t h, int32_t w, uint8_t angle,
            RotationOutputs &out) {
  switch (kind) {
    case Rotation::kUnsigned:
      kel_image_rotate(static_cast<const uint8_t *>(src), uint32_t(h), uint32_t(w), angle,
                       reinterpret_cast<uint8_t **>(&out.canvas), &out.height, &out.width,
                       &out.offset_y, &out.offset_x);
      break;
    case Rotation::kSigned:
      kel_image_rotate_int8(static_cast<const int8_t *>(src), uint32_t(h), uint32_t(w), angle,
                            reinterpret_cast<int8_t **>(&out.canvas), &out.height, &out.width,
                            &out.offset_y, &out.offset_x);
      break;
    case Rotation::kNearest:
      kel_image_rotate_int8_nn(static_cast<const int8_t *>(src), h, w, angle,
                               reinterpret_cast<int8_t **>(&out.canvas), &out.height, &out.width,
                               &out.offset_y, &out.offset_x);
      break;
  }
}

TEST(AllocationFailure, RotationsHandBackNullWithTheCanvasSize) {
  const Rotation kinds[] = {Rotation::kUnsigned, Rotation::kSigned, Rotation::kNearest};
  const int32_t sizes[][2] = {{3, 4}, {0, 0}, {1, 1}, {17, 5}};
  const uint8_t angles[] = {0, 16, 64, 100, 128, 200, 255};
  std::vector<uint8_t> pixels(17 * 5, 7);
  Untouchable untouchable;
  for (Rotation kind : kinds) {
    for (const auto &size : sizes) {
      for (uint8_t angle : angles) {
        SCOPED_TRACE(testing::Message() << "rotation " << int(kind) << " size " << size[0] << "x"
                                        << size[1] << " angle " << int(angle));
        RotationOutputs good;
        const Seen made =
            armed(-1, [&] { rotate(kind, pixels.data(), size[0], size[1], angle, good); });
        EXPECT_EQ(made.allocations, 1);
        EXPECT_EQ(made.calls.cos, 2);
        EXPECT_EQ(made.calls.sin, 2);
        ASSERT_NE(good.canvas, nullptr);
        std::free(good.canvas);

        // The source lies in memory that faults when read: a failed rotation must not read it.
        RotationOutputs failed;
        const Seen refused =
            armed(0, [&] { rotate(kind, untouchable.page, size[0], size[1], angle, failed); });
        EXPECT_EQ(refused.allocations, 1);
        EXPECT_EQ(refused.live, 0);
        // Only the turn's own cosine and sine; the opposite turn is not asked for.
        EXPECT_EQ(refused.calls.cos, 1);
        EXPECT_EQ(refused.calls.sin, 1);
        EXPECT_EQ(failed.canvas, nullptr);
        EXPECT_EQ(failed.height, good.height);
        EXPECT_EQ(failed.width, good.width);
        EXPECT_EQ(failed.offset_y, good.offset_y);
        EXPECT_EQ(failed.offset_x, good.offset_x);
      }
    }
  }
}

TEST(AllocationFailure, FillLeavesTheDestinationAndReleasesWhatItTook) {
  const uint16_t sizes[][2] = {{20, 27}, {3, 3}, {0, 5}, {9, 0}, {1, 1}};
  for (const auto &size : sizes) {
    const uint16_t h = size[0], w = size[1];
    const size_t n = size_t{h} * w;
    std::vector<uint8_t> src(n), mask(n), original(n);
    for (size_t i = 0; i < n; ++i) {
      src[i] = static_cast<uint8_t>(i * 7 + 3);
      mask[i] = (i % 5 == 0) ? 0 : 1;
      original[i] = static_cast<uint8_t>(i * 11 + 1);
    }

    // Unhindered, the fill takes its four buffers and gives every one back.
    std::vector<uint8_t> filled = original;
    const Seen whole =
        armed(-1, [&] { kel_mask_image(src.data(), h, w, mask.data(), filled.data()); });
    const int taken = whole.allocations;
    EXPECT_EQ(taken, 4);
    EXPECT_EQ(whole.live, 0);
    EXPECT_EQ(whole.calls.blur, 2);
    EXPECT_EQ(whole.calls.scale, 1);

    for (int failing = 0; failing < taken; ++failing) {
      for (bool in_place : {false, true}) {
        SCOPED_TRACE(testing::Message() << h << "x" << w << " allocation " << failing
                                        << (in_place ? " in place" : ""));
        std::vector<uint8_t> dst = in_place ? src : original;
        const std::vector<uint8_t> before = dst;
        const std::vector<uint8_t> src_before = src;
        const uint8_t *from = in_place ? dst.data() : src.data();
        const Seen seen =
            armed(failing, [&] { kel_mask_image(from, h, w, mask.data(), dst.data()); });
        EXPECT_GT(seen.allocations, failing);
        EXPECT_EQ(seen.live, 0);  // released what it had taken
        EXPECT_EQ(seen.calls.blur, 0);
        EXPECT_EQ(seen.calls.scale, 0);
        EXPECT_EQ(dst, before);
        EXPECT_EQ(src, src_before);
      }
    }
  }
}

TEST(AllocationFailure, FillRefusesSidesTheEnlargedRasterCannotCover) {
  // Sides above 65528 would give the enlarged raster a side of 65536, which 16 bits cannot hold.
  for (const uint16_t side : {uint16_t{65529}, uint16_t{65535}}) {
    for (const bool tall : {false, true}) {
      const uint16_t h = tall ? side : 2, w = tall ? 2 : side;
      const size_t n = size_t{h} * w;
      std::vector<uint8_t> src(n, 9), mask(n, 0), dst(n, 4);
      const Seen seen =
          armed(-1, [&] { kel_mask_image(src.data(), h, w, mask.data(), dst.data()); });
      EXPECT_EQ(seen.allocations, 0);
      EXPECT_EQ(seen.calls.blur, 0);
      EXPECT_EQ(seen.calls.scale, 0);
      EXPECT_EQ(dst, std::vector<uint8_t>(n, 4));
    }
  }
}

}  // namespace
