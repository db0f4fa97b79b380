// Image records, addressing, row tables and kel_set_pixel, with sizes up to the int32 extremes.
#include <cstdint>
#include <cstring>
#include <vector>

#include "fuzz_support.h"
#include "kel_images.h"

namespace {

using kel_fuzz::Guarded;
using kel_fuzz::Reader;

// Records larger than this are valid but not worth allocating thousands of times a second.
constexpr int64_t kLargestArea = 1 << 16;

int32_t record_size(Reader &in) {
  static constexpr int32_t kExtremes[] = {INT32_MIN, -1, 0, 1, 46341, 65536, INT32_MAX};
  const uint8_t selector = in.byte();
  if (selector < 200) return in.in_range(-2, 40);
  if (selector < 240) return kExtremes[selector % (sizeof kExtremes / sizeof kExtremes[0])];
  return in.i32();
}

void fuzz_record(Reader &in) {
  const int32_t height = record_size(in), width = record_size(in);
  const int32_t pixel_bytes = record_size(in);
  const int64_t row_bytes = int64_t{width} * pixel_bytes;
  const uint8_t stride_mode = in.byte();
  // Mostly a stride near the row's length, where the validity test decides.
  const int64_t near_stride = row_bytes + in.in_range(-2, 8);
  const int32_t stride = stride_mode < 128 && near_stride >= INT32_MIN && near_stride <= INT32_MAX
                             ? static_cast<int32_t>(near_stride)
                             : record_size(in);
  const int64_t area = int64_t{height} * stride;
  const bool valid = height >= 0 && width >= 0 && pixel_bytes >= 0 && row_bytes <= INT32_MAX &&
                     stride >= row_bytes && area <= INT32_MAX;
  if (valid && area > kLargestArea) return;

  kel_image *image = stride_mode < 64 && stride == row_bytes
                         ? kel_image_create(height, width, pixel_bytes)
                         : kel_image_create_ex(height, width, pixel_bytes, stride);
  KEL_CHECK((image != nullptr) == valid);
  if (image == nullptr) {
    kel_image_delete(image);
    return;
  }
  KEL_CHECK(image->data == reinterpret_cast<uint8_t *>(image + 1));
  KEL_CHECK(image->height == height && image->width == width);
  KEL_CHECK(image->stride == stride && image->pixel_bytes == pixel_bytes);

  // Every byte of the pixel area is ours to write (ASan sees it if the block is short), and the
  // clear reaches all of it, row padding included.
  std::memset(image->data, 0x5a, static_cast<size_t>(area));
  kel_image_clear(image);
  for (int64_t i = 0; i < area; ++i) KEL_CHECK(image->data[i] == 0);

  for (int probe = 0; probe < 4 && height > 0 && width > 0; ++probe) {
    const int32_t row = in.in_range(0, height - 1), col = in.in_range(0, width - 1);
    const int64_t offset = int64_t{row} * stride + int64_t{col} * pixel_bytes;
    KEL_CHECK(kel_image_offset(image, row, col) == offset);
    KEL_CHECK(kel_image_ptr(image, row, col) == image->data + offset);
  }
  // Outside the image the offset wraps in 32 bits; it must still be computed without UB.
  const int32_t far_row = in.i32(), far_col = in.i32();
  const uint32_t wrapped = static_cast<uint32_t>(far_row) * static_cast<uint32_t>(stride) +
                           static_cast<uint32_t>(far_col) * static_cast<uint32_t>(pixel_bytes);
  KEL_CHECK(kel_image_offset(image, far_row, far_col) == static_cast<int32_t>(wrapped));
  kel_image_delete(image);
}

void fuzz_row_table(Reader &in) {
  const uint32_t height = static_cast<uint32_t>(in.in_range(0, 64));
  const uint8_t step_mode = in.byte();
  const int32_t row_step = step_mode < 200 ? in.in_range(-64, 64) : in.coordinate(0, 0);
  uint8_t base[1];
  Guarded table(sizeof(uint8_t *) * height);
  std::memset(table.data(), 0x33, table.size());
  uint8_t **rows = reinterpret_cast<uint8_t **>(table.data());
  kel_images_1D_to_2D(base, height, row_step, rows);
  table.check();
  // Compared as addresses: the table may point far outside `base` without ever being used.
  const uintptr_t origin = reinterpret_cast<uintptr_t>(base);
  for (uint32_t i = 0; i < height; ++i) {
    const uintptr_t expected = origin + static_cast<uintptr_t>(int64_t{i} * row_step);
    uint8_t *entry;
    std::memcpy(&entry, table.data() + i * sizeof entry, sizeof entry);
    KEL_CHECK(reinterpret_cast<uintptr_t>(entry) == expected);
  }
}

void fuzz_set_pixel(Reader &in) {
  uint32_t height = in.size(24), width = in.size(24);
  // A raster must hold height * width bytes; an extreme side comes with an empty other side.
  if (uint64_t{height} * width > 24 * 24) (in.byte() & 1 ? height : width) = 0;
  const size_t n = static_cast<size_t>(uint64_t{height} * width);
  Guarded raster(n);
  in.pixels(raster.data(), n);
  std::vector<uint8_t> before(raster.data(), raster.data() + n);
  const uint32_t y = in.size(30);
  const uint16_t x = in.u16() % (in.byte() < 200 ? 30u : 65536u);
  const uint8_t colour = in.byte();
  kel_set_pixel(raster.data(), height, width, y, x, colour);
  raster.check();
  if (y < height && x < width) before[size_t{y} * width + x] = colour;
  KEL_CHECK(kel_fuzz::same_bytes(before.data(), raster.data(), n));
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size) {
  Reader in(data, size);
  switch (in.byte() % 3) {
    case 0:
      fuzz_record(in);
      break;
    case 1:
      fuzz_row_table(in);
      break;
    default:
      fuzz_set_pixel(in);
      break;
  }
  return 0;
}
