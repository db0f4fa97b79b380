// What the routines that allocate do when malloc fails, and that no routine takes memory any
// other way. The program is linked with --wrap for malloc, free, the other allocators and the
// outside functions, so the stand-ins below see every call the library makes; only a static
// build can be wrapped this way.
#include <gtest/gtest.h>
#include <sys/mman.h>
#include <unistd.h>

#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <functional>
#include <vector>

#include "kel_images.h"
#include "kel_outside.h"

extern "C" {
void *__real_malloc(size_t size);
void *__real_calloc(size_t count, size_t size);
void *__real_realloc(void *block, size_t size);
void *__real_aligned_alloc(size_t alignment, size_t size);
int __real_posix_memalign(void **block, size_t alignment, size_t size);
void *__real__Znwm(size_t size);  // operator new
void *__real__Znam(size_t size);  // operator new[]
void __real_free(void *block);
int32_t __real_tq_cos_(uint8_t angle);
int32_t __real_tq_sin_(uint8_t angle);
void __real_kel_blur_uint8(const uint8_t *in, uint16_t height, uint16_t width, uint8_t *out);
void __real_kel_scale_up_bilinear_uint8(const uint8_t *in, uint16_t in_height, uint16_t in_width,
                                        uint16_t factor, uint8_t *out, uint16_t out_height,
                                        uint16_t out_width);
}

namespace {

// What one armed call did. Single-threaded: nothing but the call under test runs while armed.
struct Seen {
  int mallocs = 0, live = 0;
  int foreign = 0;  // calloc, realloc, aligned allocations, operator new: never ours to call
  int cos = 0, sin = 0, blur = 0, scale = 0;
  bool operator==(const Seen &o) const { return std::memcmp(this, &o, sizeof o) == 0; }
};
std::ostream &operator<<(std::ostream &o, const Seen &s) {
  return o << "mallocs " << s.mallocs << ", live " << s.live << ", other allocations " << s.foreign
           << ", cos " << s.cos << ", sin " << s.sin << ", blur " << s.blur << ", scale "
           << s.scale;
}
bool g_armed = false;
int g_fail_at = -1;  // which malloc of the armed call fails, from 0; -1: none
Seen g_seen;

Seen armed(int failing, const std::function<void()> &call) {
  g_seen = Seen{};
  g_fail_at = failing;
  g_armed = true;
  call();
  g_armed = false;
  return g_seen;
}

}  // namespace

extern "C" {
void *__wrap_malloc(size_t size) {
  if (!g_armed) return __real_malloc(size);
  if (g_seen.mallocs++ == g_fail_at) return nullptr;
  ++g_seen.live;
  return __real_malloc(size);
}
void *__wrap_calloc(size_t count, size_t size) {
  g_seen.foreign += g_armed;
  return __real_calloc(count, size);
}
void *__wrap_realloc(void *block, size_t size) {
  g_seen.foreign += g_armed;
  return __real_realloc(block, size);
}
void *__wrap_aligned_alloc(size_t alignment, size_t size) {
  g_seen.foreign += g_armed;
  return __real_aligned_alloc(alignment, size);
}
int __wrap_posix_memalign(void **block, size_t alignment, size_t size) {
  g_seen.foreign += g_armed;
  return __real_posix_memalign(block, alignment, size);
}
void *__wrap__Znwm(size_t size) {
  g_seen.foreign += g_armed;
  return __real__Znwm(size);
}
void *__wrap__Znam(size_t size) {
  g_seen.foreign += g_armed;
  return __real__Znam(size);
}
void __wrap_free(void *block) {
  g_seen.live -= g_armed && block;
  __real_free(block);
}
int32_t __wrap_tq_cos_(uint8_t angle) {
  return g_seen.cos += g_armed, __real_tq_cos_(angle);
}
int32_t __wrap_tq_sin_(uint8_t angle) {
  return g_seen.sin += g_armed, __real_tq_sin_(angle);
}
void __wrap_kel_blur_uint8(const uint8_t *in, uint16_t height, uint16_t width, uint8_t *out) {
  g_seen.blur += g_armed;
  __real_kel_blur_uint8(in, height, width, out);
}
void __wrap_kel_scale_up_bilinear_uint8(const uint8_t *in, uint16_t in_height, uint16_t in_width,
                                        uint16_t factor, uint8_t *out, uint16_t out_height,
                                        uint16_t out_width) {
  g_seen.scale += g_armed;
  __real_kel_scale_up_bilinear_uint8(in, in_height, in_width, factor, out, out_height, out_width);
}
}  // extern "C"

namespace {

using Bytes = std::vector<uint8_t>;

// A page that faults when touched: a rotation whose canvas failed must not read its source.
const uint8_t *untouchable() {
  static void *page =
      mmap(nullptr, size_t(sysconf(_SC_PAGESIZE)), PROT_NONE, MAP_PRIVATE | MAP_ANONYMOUS, -1, 0);
  return static_cast<const uint8_t *>(page);
}

// Every routine that allocates, unhindered and with each of its mallocs failing in turn.
TEST(AllocationFailure, EveryAllocationFailsCleanly) {
  struct Rotation {
    int kind;
    int32_t h, w;
    uint8_t angle;
  };
  for (const Rotation r : {Rotation{0, 3, 4, 0}, Rotation{1, 3, 4, 100}, Rotation{2, 17, 5, 200},
                           Rotation{1, 0, 0, 64}, Rotation{2, 1, 1, 255}, Rotation{0, 5, 9, 30}}) {
    SCOPED_TRACE(testing::Message() << "rotation " << r.kind << " angle " << int(r.angle));
    const Bytes src(size_t(r.h) * size_t(r.w) + 1, 7);
    auto rotate = [&](const uint8_t *from, void **canvas, int32_t *g) {
      const auto *s = reinterpret_cast<const int8_t *>(from);
      auto **c = reinterpret_cast<int8_t **>(canvas);
      if (r.kind == 0)
        kel_image_rotate(from, uint32_t(r.h), uint32_t(r.w), r.angle,
                         reinterpret_cast<uint8_t **>(canvas), g, g + 1, g + 2, g + 3);
      if (r.kind == 1)
        kel_image_rotate_int8(s, uint32_t(r.h), uint32_t(r.w), r.angle, c, g, g + 1, g + 2, g + 3);
      if (r.kind == 2) kel_image_rotate_int8_nn(s, r.h, r.w, r.angle, c, g, g + 1, g + 2, g + 3);
    };
    void *canvas = nullptr, *failed = &canvas;
    int32_t made[4], refused[4] = {-1, -1, -1, -1};
    Seen whole;
    whole.mallocs = whole.live = 1, whole.cos = whole.sin = 2;
    EXPECT_EQ(armed(-1, [&] { rotate(src.data(), &canvas, made); }), whole);
    std::free(canvas);
    whole.live = 0, whole.cos = whole.sin = 1;  // the opposite turn is not asked for
    EXPECT_EQ(armed(0, [&] { rotate(untouchable(), &failed, refused); }), whole);
    EXPECT_EQ(failed, nullptr);
    EXPECT_EQ(std::memcmp(made, refused, sizeof made), 0);  // the canvas that was asked for
  }

  for (const int size : {20 * 256 + 27, 3 * 256 + 3, 5, 9 * 256, 256 + 1, 65535 * 256 + 2}) {
    for (const bool in_place : {false, true}) {
      const auto h = uint16_t(size >> 8), w = uint16_t(size & 255);
      SCOPED_TRACE(testing::Message() << "fill " << h << "x" << w << (in_place ? " in place" : ""));
      const size_t n = size_t{h} * w;
      Bytes src(n), mask(n), dst(n);
      for (size_t i = 0; i < n; ++i) {
        src[i] = uint8_t(i * 7 + 3), mask[i] = i % 5 != 0, dst[i] = uint8_t(i * 11 + 1);
      }
      Bytes &out = in_place ? src : dst;
      const Bytes before = out;
      Seen whole;  // four scratch buffers, all given back; sides beyond 65528 take none
      if (h <= 65528) whole.mallocs = 4, whole.blur = 2, whole.scale = 1;
      Seen failed;
      for (int k = 0; k < whole.mallocs; ++k) {
        failed.mallocs = k + 1;
        out = before;
        EXPECT_EQ(armed(k, [&] { kel_mask_image(src.data(), h, w, mask.data(), out.data()); }),
                  failed)
            << "malloc " << k;
        EXPECT_EQ(out, before);
      }
      EXPECT_EQ(armed(-1, [&] { kel_mask_image(src.data(), h, w, mask.data(), out.data()); }),
                whole);
      EXPECT_EQ(out != before, whole.mallocs > 0 && n > 0);
    }
  }

  const int32_t kImages[][4] = {{10, 20, 3, 61}, {7, 9, 2, -1}, {0, 0, 0, 0}};
  for (const auto &size : kImages) {
    kel_image *image = nullptr;
    auto create = [&] {
      image = size[3] < 0 ? kel_image_create(size[0], size[1], size[2])
                          : kel_image_create_ex(size[0], size[1], size[2], size[3]);
    };
    Seen seen;
    seen.mallocs = 1;
    EXPECT_EQ(armed(0, create), seen);
    EXPECT_EQ(image, nullptr);
    seen.live = 1;
    EXPECT_EQ(armed(-1, create), seen);
    seen = Seen{};
    seen.live = -1;
    EXPECT_EQ(armed(-1, [&] { kel_image_delete(image); }), seen);
  }
}

// The heap-free twins take no memory at all; given a buffer one byte short they write nothing
// and call nothing outside, and given enough they make the same calls as the heap-using ones.
TEST(AllocationFailure, HeapFreeCallsTakeNoMemory) {
  const Bytes src(5 * 9, 7);
  kel_canvas canvas;
  Seen sized;
  sized.cos = sized.sin = 1;
  size_t bytes = 0;
  EXPECT_EQ(armed(-1, [&] { bytes = kel_rotation_canvas(5, 9, 30, &canvas); }), sized);
  ASSERT_EQ(bytes, size_t(canvas.height) * size_t(canvas.width));
  Bytes pixels(bytes, 1);
  EXPECT_EQ(armed(-1,
                  [&] {
                    kel_image_rotate_into(src.data(), 5, 9, 30, &canvas, pixels.data(), bytes - 1);
                  }),
            Seen{});
  EXPECT_EQ(pixels, Bytes(bytes, 1));
  EXPECT_EQ(
      armed(-1,
            [&] { kel_image_rotate_into(src.data(), 5, 9, 30, &canvas, pixels.data(), bytes); }),
      sized);

  const uint16_t h = 20, w = 27;
  Bytes mask(size_t{h} * w, 1), out(size_t{h} * w, 9);
  mask[100] = 0;
  const size_t scratch_bytes = kel_mask_image_scratch_size(h, w);
  Bytes scratch(scratch_bytes);
  EXPECT_EQ(armed(-1,
                  [&] {
                    kel_mask_image_into(src.data(), h, w, mask.data(), out.data(), scratch.data(),
                                        scratch_bytes - 1);
                  }),
            Seen{});
  EXPECT_EQ(out, Bytes(size_t{h} * w, 9));
  Seen filled;
  filled.blur = 2, filled.scale = 1;
  Bytes source(size_t{h} * w, 50);
  EXPECT_EQ(armed(-1,
                  [&] {
                    kel_mask_image_into(source.data(), h, w, mask.data(), out.data(),
                                        scratch.data(), scratch_bytes);
                  }),
            filled);
  EXPECT_EQ(kel_mask_image_scratch_size(65529, 1), 0u);
}

}  // namespace
