// Image records, addressing, row tables and the single clipped pixel write.
#include <cstdlib>
#include <cstring>

#include "kel_images.h"

namespace {

// Signed 32-bit product, or -1 when it leaves the non-negative int32 range. Sizes are never
// negative here, so -1 is free to mean "too large".
int64_t checked_size(int32_t a, int32_t b) {
  const int64_t product = int64_t{a} * int64_t{b};
  return product > INT32_MAX ? -1 : product;
}

// Two's-complement wrapping of a product that the record's 32-bit arithmetic defines; done in
// unsigned so that it is never signed overflow.
uint32_t wrapping_offset(const kel_image *image, int32_t row, int32_t col) {
  return static_cast<uint32_t>(row) * static_cast<uint32_t>(image->stride) +
         static_cast<uint32_t>(col) * static_cast<uint32_t>(image->pixel_bytes);
}

}  // namespace

extern "C" {

kel_image *kel_image_create_ex(int32_t height, int32_t width, int32_t pixel_bytes, int32_t stride) {
  if (height < 0 || width < 0 || pixel_bytes < 0) return nullptr;
  const int64_t row_bytes = checked_size(width, pixel_bytes);
  if (row_bytes < 0 || stride < row_bytes) return nullptr;
  const int64_t area = checked_size(height, stride);
  if (area < 0) return nullptr;
  // The record plus at most INT32_MAX bytes fits size_t on every 32- and 64-bit target.
  void *block = std::malloc(sizeof(kel_image) + static_cast<size_t>(area));
  if (block == nullptr) return nullptr;
  kel_image *image = static_cast<kel_image *>(block);
  image->data = reinterpret_cast<uint8_t *>(image + 1);
  image->height = height;
  image->width = width;
  image->stride = stride;
  image->pixel_bytes = pixel_bytes;
  return image;
}

kel_image *kel_image_create(int32_t height, int32_t width, int32_t pixel_bytes) {
  // A row too long for 32 bits is refused here rather than passed on as a wrapped product.
  const int64_t row_bytes = checked_size(width, pixel_bytes);
  if (row_bytes < 0) return nullptr;
  return kel_image_create_ex(height, width, pixel_bytes, static_cast<int32_t>(row_bytes));
}

void kel_image_delete(kel_image *image) {
  std::free(image);
}

void kel_image_clear(kel_image *image) {
  const int64_t area = int64_t{image->height} * int64_t{image->stride};
  if (area > 0) std::memset(image->data, 0, static_cast<size_t>(area));
}

uint8_t *kel_image_ptr(const kel_image *image, int32_t row, int32_t col) {
  return image->data + kel_image_offset(image, row, col);
}

int32_t kel_image_offset(const kel_image *image, int32_t row, int32_t col) {
  return static_cast<int32_t>(wrapping_offset(image, row, col));
}

void kel_images_1D_to_2D(uint8_t *buf, uint32_t height, int32_t row_step, uint8_t **rows) {
  for (uint32_t i = 0; i < height; ++i) rows[i] = buf + int64_t{i} * row_step;
}

void kel_set_pixel(uint8_t *buf, uint32_t height, uint32_t width, uint32_t y, uint16_t x,
                   uint8_t colour) {
  if (y < height && x < width) buf[size_t{y} * width + x] = colour;
}

}  // extern "C"
