// What every fuzz target shares: a reader that turns the fuzz input into sizes, coordinates and
// pixels (with the extreme values one selector byte away), and rasters fenced by guard bytes.
#ifndef KEL_FUZZ_SUPPORT_H
#define KEL_FUZZ_SUPPORT_H

#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <vector>

namespace kel_fuzz {

// A failed check is a crash that libFuzzer records together with the input that caused it.
[[noreturn]] inline void fail(const char *what, const char *file, int line) {
  std::fprintf(stderr, "%s:%d: check failed: %s\n", file, line, what);
  std::abort();
}

#define KEL_CHECK(condition) \
  ((condition) ? static_cast<void>(0) : ::kel_fuzz::fail(#condition, __FILE__, __LINE__))

// KEL_FUZZ_TRACE=1 in the environment prints every call a target makes, which turns a crash
// file into a reproducer that can be read.
inline bool tracing() {
  static const bool on = std::getenv("KEL_FUZZ_TRACE") != nullptr;
  return on;
}

#define KEL_TRACE(...)                                                          \
  (::kel_fuzz::tracing() ? static_cast<void>(std::fprintf(stderr, __VA_ARGS__)) \
                         : static_cast<void>(0))

// memcmp for buffers that may be empty (and then have no address at all).
inline bool same_bytes(const void *a, const void *b, size_t n) {
  return n == 0 || std::memcmp(a, b, n) == 0;
}

// Reads the fuzz input front to back; once it is used up every read yields 0, so any input,
// the empty one included, decodes to some valid call.
class Reader {
 public:
  Reader(const uint8_t *data, size_t size) : data_(data), size_(size) {}

  bool empty() const { return pos_ >= size_; }

  uint8_t byte() { return empty() ? 0 : data_[pos_++]; }

  uint16_t u16() { return static_cast<uint16_t>(byte() | (unsigned{byte()} << 8)); }

  uint32_t u32() {
    const uint32_t low = u16();
    return low | (uint32_t{u16()} << 16);
  }

  int32_t i32() { return static_cast<int32_t>(u32()); }

  // A value in [lo, hi], both inclusive and inside int32; spans beyond 2^16 are not covered
  // evenly.
  int32_t in_range(int64_t lo, int64_t hi) {
    const uint64_t span = static_cast<uint64_t>(hi - lo) + 1u;
    return static_cast<int32_t>(lo + static_cast<int64_t>(u16() % span));
  }

  // A coordinate: mostly near the raster (within `reach` of [0, extent)), sometimes one of the
  // values where 32-bit arithmetic breaks, sometimes any 32-bit value.
  int32_t coordinate(int32_t extent, int32_t reach) {
    static constexpr int32_t kExtremes[] = {
        INT32_MIN, INT32_MIN + 1, INT32_MIN / 2, -65536,        -1,
        0,         65535,         INT32_MAX / 2, INT32_MAX - 1, INT32_MAX};
    const uint8_t selector = byte();
    if (selector < 200) {
      const int64_t hi = int64_t{extent} + reach;
      return in_range(-int64_t{reach}, hi < INT32_MAX ? hi : INT32_MAX);
    }
    if (selector < 240) return kExtremes[selector % (sizeof kExtremes / sizeof kExtremes[0])];
    return i32();
  }

  // An unsigned size: mostly small, sometimes an extreme such as 2^32 - 1.
  uint32_t size(uint32_t small_max) {
    static constexpr uint32_t kExtremes[] = {
        0u, 1u, 2u, 3u, 65535u, 65536u, 0x7fffffffu, 0x80000000u, 0xfffffffeu, 0xffffffffu};
    const uint8_t selector = byte();
    if (selector < 200) return u16() % (small_max + 1u);
    if (selector < 240) return kExtremes[selector % (sizeof kExtremes / sizeof kExtremes[0])];
    return u32();
  }

  // Pixels: straight from the input while it lasts, then from a small generator seeded by the
  // input, so that short inputs still give varied pictures. Some inputs ask for few distinct
  // values, which makes keys and masks meet the pixels often.
  void pixels(uint8_t *out, size_t n) {
    const uint8_t palette = byte();
    uint32_t state = 0x9e3779b9u ^ u32();
    for (size_t i = 0; i < n; ++i) {
      uint8_t value;
      if (!empty()) {
        value = byte();
      } else {
        state ^= state << 13;
        state ^= state >> 17;
        state ^= state << 5;
        value = static_cast<uint8_t>(state >> 24);
      }
      if (palette < 96) value = static_cast<uint8_t>(value % (palette % 4u + 2u));
      out[i] = value;
    }
  }

 private:
  const uint8_t *data_;
  size_t size_;
  size_t pos_ = 0;
};

// A buffer of n bytes between two guard zones of known content. check() aborts when a guard
// byte changed: the routine wrote outside the memory it was given. ASan sees reads and writes
// beyond the guards; the guards catch the writes just outside the raster that ASan cannot see.
class Guarded {
 public:
  static constexpr size_t kGuard = 64;

  explicit Guarded(size_t n) : size_(n), storage_(n + 2 * kGuard) {
    for (size_t i = 0; i < kGuard; ++i) {
      storage_[i] = guard_byte(i);
      storage_[kGuard + n + i] = guard_byte(i + 1000);
    }
  }

  uint8_t *data() { return storage_.data() + kGuard; }
  const uint8_t *data() const { return storage_.data() + kGuard; }
  int8_t *signed_data() { return reinterpret_cast<int8_t *>(data()); }
  size_t size() const { return size_; }

  void check() const {
    for (size_t i = 0; i < kGuard; ++i) {
      KEL_CHECK(storage_[i] == guard_byte(i));
      KEL_CHECK(storage_[kGuard + size_ + i] == guard_byte(i + 1000));
    }
  }

  bool same_pixels(const Guarded &other) const {
    return size_ == other.size_ && same_bytes(data(), other.data(), size_);
  }

  void copy_from(const Guarded &other) {
    KEL_CHECK(other.size_ == size_);
    if (size_ != 0) std::memcpy(data(), other.data(), size_);
  }

 private:
  static uint8_t guard_byte(size_t i) { return static_cast<uint8_t>(0xa5u ^ (i * 37u)); }

  size_t size_;
  std::vector<uint8_t> storage_;
};

// Pixels of a raster whose sides may be zero or negative (a side <= 0 gives no pixels).
inline size_t pixel_count(int64_t height, int64_t width) {
  return height > 0 && width > 0 ? static_cast<size_t>(height * width) : 0;
}

}  // namespace kel_fuzz

#endif  // KEL_FUZZ_SUPPORT_H
