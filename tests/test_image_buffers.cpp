#include <gtest/gtest.h>

#include <climits>
#include <cstdint>
#include <utility>
#include <vector>

#include "kel_images.h"
#include "test_support.h"

namespace {

struct CreateCase {
  int32_t height, width, pixel_bytes, stride;
  bool valid;
};

const CreateCase kCreateCases[] = {
    {10, 20, 3, 60, true},
    {10, 20, 3, 61, true},
    {10, 20, 3, 59, false},
    {0, 0, 0, 0, true},
    {5, 0, 0, 0, true},
    {5, 0, 1, -7, false},
    {5, 3, 0, -1, false},
    {-1, 1, 1, 1, false},
    {1, -1, 1, 1, false},
    {1, 1, -1, 1, false},
    {-1, -1, -1, -1, false},
    // Products that leave the signed 32-bit range are refused, never handed out short.
    {1, 65536, 32768, INT32_MAX, false},
    {2, 1, 1, INT32_MAX, false},
    {INT32_MAX, 0, 0, 2, false},
    {INT32_MAX, 0, 0, 0, true},
};

TEST(ImageCreate, AcceptsExactlyTheRepresentableSizes) {
  for (const CreateCase &c : kCreateCases) {
    SCOPED_TRACE(testing::Message()
                 << c.height << " " << c.width << " " << c.pixel_bytes << " " << c.stride);
    kel_image *image = kel_image_create_ex(c.height, c.width, c.pixel_bytes, c.stride);
    ASSERT_EQ(image != nullptr, c.valid);
    if (image == nullptr) continue;
    EXPECT_EQ(image->data, reinterpret_cast<uint8_t *>(image + 1));
    EXPECT_EQ(image->height, c.height);
    EXPECT_EQ(image->width, c.width);
    EXPECT_EQ(image->stride, c.stride);
    EXPECT_EQ(image->pixel_bytes, c.pixel_bytes);
    kel_image_delete(image);
  }
}

TEST(ImageCreate, PacksRowsWithoutGapsAndDeleteAcceptsNull) {
  kel_image *image = kel_image_create(7, 9, 2);
  ASSERT_NE(image, nullptr);
  EXPECT_EQ(image->stride, 18);
  kel_image_clear(image);  // 126 bytes: the sanitizer build checks the block is that large
  kel_image_delete(image);
  EXPECT_EQ(kel_image_create(1, 65536, 65536), nullptr);
  EXPECT_EQ(kel_image_create(1, -3, 2), nullptr);
  kel_image_delete(nullptr);
}

// A record placed by hand in a larger buffer shows exactly how far the clear reaches.
TEST(ImageAddressing, FollowsStrideAndPixelSizeAndClearCoversTheWholeArea) {
  std::vector<uint8_t> memory(100, 0xAB);
  kel_image image{memory.data() + 8, 4, 5, 16, 3};
  EXPECT_EQ(kel_image_offset(&image, 2, 3), 41);
  EXPECT_EQ(kel_image_ptr(&image, 2, 3), image.data + 41);
  EXPECT_EQ(kel_image_offset(&image, 0, 0), 0);
  kel_image_clear(&image);
  for (size_t i = 0; i < memory.size(); ++i)
    EXPECT_EQ(memory[i], (i >= 8 && i < 72) ? 0 : 0xAB) << i;
}

TEST(RowTable, PointsAtEveryRowAndLeavesTheRestAlone) {
  uint8_t buf[256];
  uint8_t *rows[5] = {nullptr, nullptr, nullptr, nullptr, nullptr};
  kel_images_1D_to_2D(buf, 4, 48, rows);
  EXPECT_EQ(std::vector<uint8_t *>(rows, rows + 5),
            (std::vector<uint8_t *>{buf, buf + 48, buf + 96, buf + 144, nullptr}));
  kel_images_1D_to_2D(buf, 0, 48, rows + 4);
  EXPECT_EQ(rows[4], nullptr);
}

// On a guarded 10 x 10 raster; x passes through the 16-bit parameter.
TEST(SetPixel, ClipsWithUnsignedComparisons) {
  const std::pair<std::pair<uint32_t, uint32_t>, int> kCases[] = {
      {{3, 4}, 34},  {{0, 0}, 0},           {{9, 9}, 99},         {{10, 0}, -1},
      {{0, 10}, -1}, {{UINT32_MAX, 0}, -1}, {{3, 65536 + 4}, 34}, {{3, 65535}, -1},
  };
  for (const auto &[at, offset] : kCases) {
    kel_test::Guarded raster(100, 0);
    kel_set_pixel(raster.data(), 10, 10, at.first, static_cast<uint16_t>(at.second), 7);
    std::vector<uint8_t> expected(100, 0);
    if (offset >= 0) expected[size_t(offset)] = 7;
    EXPECT_EQ(raster.inside(), expected) << "y " << at.first << " x " << at.second;
    EXPECT_TRUE(raster.guards_intact()) << "y " << at.first << " x " << at.second;
  }
}

}  // namespace
