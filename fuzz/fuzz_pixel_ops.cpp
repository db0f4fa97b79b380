// Point operations, paste and blend, and the masked fill: guards around every raster, in place
// equal to out of place, the paste and blend against a pixel-by-pixel model (overlapping rasters
// included), and the fill's promises about known pixels and untouched inputs.
#include <cstdint>
#include <cstring>
#include <vector>

#include "fuzz_support.h"
#include "kel_images.h"
#include "kel_outside.h"

namespace {

using kel_fuzz::Guarded;
using kel_fuzz::Reader;

enum class PointOp { kBrighten, kDarken, kMask };

void apply(PointOp op, const uint8_t *src, uint32_t h, uint32_t w, uint32_t arg, uint8_t *dst) {
  KEL_TRACE("point op %d h=%u w=%u arg=%u in_place=%d\n", static_cast<int>(op), unsigned{h},
            unsigned{w}, unsigned{arg}, src == dst);
  switch (op) {
    case PointOp::kBrighten:
      kel_image_brighten(src, h, w, arg, dst);
      break;
    case PointOp::kDarken:
      kel_image_darken(src, h, w, arg, dst);
      break;
    case PointOp::kMask:
      kel_get_mask(src, h, w, static_cast<int32_t>(arg), dst);
      break;
  }
}

uint8_t model_point(PointOp op, uint8_t s, uint32_t arg) {
  const uint32_t p = arg < 100 ? arg : 100;
  switch (op) {
    case PointOp::kBrighten:
      return static_cast<uint8_t>(s + p * (255u - s) / 100u);
    case PointOp::kDarken:
      return static_cast<uint8_t>(s - p * s / 100u);
    case PointOp::kMask:
      break;
  }
  return static_cast<int32_t>(arg) == int32_t{s} ? 0 : 1;
}

void fuzz_point_op(Reader &in) {
  const PointOp op = static_cast<PointOp>(in.byte() % 3);
  uint32_t h = in.size(64), w = in.size(64);
  if (uint64_t{h} * w > 64 * 64) (in.byte() & 1 ? h : w) = 0;
  const size_t n = static_cast<size_t>(uint64_t{h} * w);
  uint32_t arg;
  if (op == PointOp::kMask) {
    const uint8_t selector = in.byte();
    arg = selector < 200 ? in.byte() : static_cast<uint32_t>(in.coordinate(256, 4));
  } else {
    arg = in.size(120);
  }
  Guarded src(n), dst(n), in_place(n);
  in.pixels(src.data(), n);
  in.pixels(dst.data(), n);  // stale contents the routine must overwrite
  in_place.copy_from(src);
  Guarded before(n);
  before.copy_from(src);

  apply(op, src.data(), h, w, arg, dst.data());
  apply(op, in_place.data(), h, w, arg, in_place.data());
  src.check();
  dst.check();
  in_place.check();
  KEL_CHECK(src.same_pixels(before));
  KEL_CHECK(in_place.same_pixels(dst));
  for (size_t i = 0; i < n; ++i) KEL_CHECK(dst.data()[i] == model_point(op, src.data()[i], arg));
}

// The visible rectangle and the pixel walk, exactly as the paste and blend are defined, in 64
// bits, reading and writing one memory image so that overlapping rasters are modelled too.
void model_paste(bool blend, uint8_t *memory, size_t dst_at, int64_t dst_h, int64_t dst_w,
                 size_t src_at, int64_t src_h, int64_t src_w, int64_t x, int64_t y, uint16_t key) {
  const int64_t first_row = y <= 0 ? -y : 0;
  const int64_t last_row = src_h + y < dst_h ? src_h - 1 : dst_h - y - 1;
  const int64_t first_col = x <= 0 ? -x : 0;
  const int64_t last_col = src_w + x < dst_w ? src_w - 1 : dst_w - x - 1;
  for (int64_t sy = first_row; sy <= last_row; ++sy) {
    for (int64_t sx = first_col; sx <= last_col; ++sx) {
      const uint8_t s = memory[src_at + static_cast<size_t>(sy * src_w + sx)];
      if (key <= 255 && s == key) continue;
      uint8_t &d = memory[dst_at + static_cast<size_t>((y + sy) * dst_w + x + sx)];
      d = blend ? static_cast<uint8_t>((d + s) >> 1) : s;
    }
  }
}

void fuzz_paste(Reader &in) {
  const bool blend = in.byte() & 1;
  const uint8_t overlap = in.byte();
  int32_t dst_h = in.coordinate(24, 4), dst_w = in.coordinate(24, 4);
  // The destination holds dst_h * dst_w pixels: an extreme side comes with an empty other side.
  if (dst_h > 48 && dst_w > 0) dst_w = 0;
  if (dst_w > 48 && dst_h > 0) dst_h = 0;
  uint16_t src_h = static_cast<uint16_t>(in.u16() % 40),
           src_w = static_cast<uint16_t>(in.u16() % 40);
  // A source side of up to 65535 comes with an empty other side.
  if (in.byte() >= 240) (in.byte() & 1 ? src_h : src_w) = static_cast<uint16_t>(in.u16());
  if (src_h > 40 && src_w > 0) src_w = 0;
  if (src_w > 40 && src_h > 0) src_h = 0;
  const int32_t x = in.coordinate(dst_w > 0 ? dst_w : 1, 44);
  const int32_t y = in.coordinate(dst_h > 0 ? dst_h : 1, 44);
  const uint16_t key = in.byte() < 160 ? in.byte() : in.u16();

  const size_t dst_n = kel_fuzz::pixel_count(dst_h, dst_w);
  const size_t src_n = size_t{src_h} * src_w;
  // Either two separate rasters in one memory block, or two that overlap at a fuzzed distance.
  const size_t src_at = overlap < 128 ? dst_n : in.u16() % (dst_n + 1);
  const size_t dst_at = 0;
  const size_t total = (dst_n > src_at + src_n ? dst_n : src_at + src_n);
  Guarded memory(total);
  in.pixels(memory.data(), total);
  std::vector<uint8_t> model(memory.data(), memory.data() + total);

  KEL_TRACE("%s dst=%dx%d src=%ux%u at offset %zu x=%d y=%d key=%u\n", blend ? "blend" : "paste",
            int{dst_h}, int{dst_w}, unsigned{src_h}, unsigned{src_w}, src_at, int{x}, int{y},
            unsigned{key});
  uint8_t *dst = memory.data() + dst_at;
  const uint8_t *src = memory.data() + src_at;
  if (blend) {
    kel_image_blend_image(dst, dst_h, dst_w, src, src_h, src_w, x, y, key);
  } else {
    kel_image_draw_image(dst, dst_h, dst_w, src, src_h, src_w, x, y, key);
  }
  memory.check();

  // The clipping is exact in 64 bits, so the model binds for every placement, even one whose
  // far edges pass 2^31.
  model_paste(blend, model.data(), dst_at, dst_h, dst_w, src_at, src_h, src_w, x, y, key);
  KEL_CHECK(kel_fuzz::same_bytes(model.data(), memory.data(), total));
}

// The masked fill step by step as it is defined, on plain vectors, with our outside blur and
// enlargement. Buffers are never empty, so that zero sizes pass real pointers.
std::vector<uint8_t> model_fill(const uint8_t *src, uint16_t h, uint16_t w, const uint8_t *mask) {
  const size_t gh = (h + 7u) / 8u, gw = (w + 7u) / 8u, bh = gh * 8, bw = gw * 8;
  std::vector<uint8_t> out(src, src + size_t{h} * w);
  out.push_back(0);
  auto neighbour_mask = [&](size_t y, size_t x, bool want_hole) {
    for (size_t ny = y - 1; ny <= y + 1; ++ny) {
      for (size_t nx = x - 1; nx <= x + 1; ++nx) {
        if ((ny != y || nx != x) && (mask[ny * w + nx] == 0) == want_hole) return true;
      }
    }
    return false;
  };
  std::vector<uint8_t> current(gh * gw + 1, 0);
  for (size_t y = 1; h > 2 && w > 2 && y + 1 < h; ++y) {
    for (size_t x = 1; x + 1 < w; ++x) {
      if (mask[y * w + x] == 0 || !neighbour_mask(y, x, true)) continue;
      uint8_t &cell = current[(y >> 3) * gw + (x >> 3)];
      if (cell < src[y * w + x]) cell = src[y * w + x];
    }
  }
  std::vector<uint8_t> next = current;
  for (size_t filled = 1; filled != 0;) {
    filled = 0;
    for (size_t cy = 0; cy < gh; ++cy) {
      for (size_t cx = 0; cx < gw; ++cx) {
        if (current[cy * gw + cx] != 0) continue;
        uint8_t largest = 0;
        for (size_t ny = cy ? cy - 1 : 0; ny <= cy + 1 && ny < gh; ++ny) {
          for (size_t nx = cx ? cx - 1 : 0; nx <= cx + 1 && nx < gw; ++nx) {
            if (current[ny * gw + nx] > largest) largest = current[ny * gw + nx];
          }
        }
        if (largest != 0) {
          next[cy * gw + cx] = largest;
          ++filled;
        }
      }
    }
    current = next;
  }
  kel_blur_uint8(current.data(), uint16_t(gh), uint16_t(gw), current.data());
  std::vector<uint8_t> big(bh * bw + 1);
  kel_scale_up_bilinear_uint8(current.data(), uint16_t(gh), uint16_t(gw), 8, big.data(),
                              uint16_t(bh), uint16_t(bw));
  for (size_t y = 0; y < h; ++y) {
    for (size_t x = 0; x < w; ++x) {
      if (mask[y * w + x] == 0) out[y * w + x] = big[y * bw + x];
    }
  }
  std::vector<uint8_t> blurred(size_t{h} * w + 1);
  kel_blur_uint8(out.data(), h, w, blurred.data());
  for (size_t y = 1; h > 2 && w > 2 && y + 1 < h; ++y) {
    for (size_t x = 1; x + 1 < w; ++x) {
      if (mask[y * w + x] == 0 && neighbour_mask(y, x, false)) out[y * w + x] = blurred[y * w + x];
    }
  }
  out.pop_back();
  return out;
}

void fill_mask(Reader &in, uint8_t *mask, const uint8_t *src, uint16_t h, uint16_t w) {
  const size_t n = size_t{h} * w;
  const uint8_t mode = in.byte() % 4;
  if (mode == 0) {
    in.pixels(mask, n);
  } else if (mode == 1) {
    kel_get_mask(src, h, w, in.byte(), mask);
  } else {
    // One or two rectangular holes.
    std::memset(mask, mode == 3 ? 0 : 1, n);
    for (int hole = 0; hole < 2 && h > 0 && w > 0; ++hole) {
      const int32_t top = in.in_range(0, h - 1), left = in.in_range(0, w - 1);
      const int32_t bottom = in.in_range(top, h - 1), right = in.in_range(left, w - 1);
      for (int32_t r = top; r <= bottom; ++r) {
        std::memset(mask + size_t(r) * w + left, mode == 3 ? 7 : 0, size_t(right - left + 1));
      }
    }
  }
}

void fuzz_fill(Reader &in) {
  uint16_t h = static_cast<uint16_t>(in.in_range(0, 100));
  uint16_t w = static_cast<uint16_t>(in.in_range(0, 100));
  const uint8_t extreme = in.byte();
  // Sides up to 65535, past what the enlarged raster's 16-bit sides can cover, with a tiny or
  // empty other side.
  if (extreme >= 236) {
    const uint16_t big = static_cast<uint16_t>(65520 + in.byte() % 16);
    if (extreme & 1) {
      h = big;
      w = static_cast<uint16_t>(w % 3);
    } else {
      w = big;
      h = static_cast<uint16_t>(h % 3);
    }
  }
  const size_t n = size_t{h} * w;
  Guarded src(n), mask(n), dst(n), in_place(n);
  in.pixels(src.data(), n);
  fill_mask(in, mask.data(), src.data(), h, w);
  in.pixels(dst.data(), n);
  in_place.copy_from(src);
  Guarded src_before(n), mask_before(n), dst_before(n);
  src_before.copy_from(src);
  mask_before.copy_from(mask);
  dst_before.copy_from(dst);

  KEL_TRACE("mask_image h=%u w=%u\n", unsigned{h}, unsigned{w});
  kel_mask_image(src.data(), h, w, mask.data(), dst.data());
  kel_mask_image(in_place.data(), h, w, mask.data(), in_place.data());
  src.check();
  mask.check();
  dst.check();
  in_place.check();
  KEL_CHECK(src.same_pixels(src_before));
  KEL_CHECK(mask.same_pixels(mask_before));
  if (h > 65528 || w > 65528) {
    // Sides whose enlarged raster cannot have 16-bit sides: the fill leaves the image alone.
    KEL_CHECK(dst.same_pixels(dst_before));
    KEL_CHECK(in_place.same_pixels(src));
    return;
  }
  KEL_CHECK(in_place.same_pixels(dst));
  for (size_t i = 0; i < n; ++i) {
    if (mask.data()[i] != 0) KEL_CHECK(dst.data()[i] == src.data()[i]);
  }
  if (n <= 128 * 128) {
    const std::vector<uint8_t> model = model_fill(src.data(), h, w, mask.data());
    KEL_CHECK(kel_fuzz::same_bytes(model.data(), dst.data(), n));
  }
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size) {
  Reader in(data, size);
  switch (in.byte() % 3) {
    case 0:
      fuzz_point_op(in);
      break;
    case 1:
      fuzz_paste(in);
      break;
    default:
      fuzz_fill(in);
      break;
  }
  return 0;
}
