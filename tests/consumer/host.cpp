// The smallest C++ host: the header is used from C++ through its extern "C" block.
#include <cstdint>
#include <vector>

#include "kel_images.h"

int main() {
  std::vector<uint8_t> raster(16 * 16, 0);
  kel_image_draw_circle(raster.data(), 16, 16, 8, 7, 7, 255);
  std::uint32_t hist[256];
  kel_image_histogram(raster.data(), 16, 16, hist);
  return (hist[255] == 20 && KEL_IMAGES_VERSION_MAJOR >= 0) ? 0 : 1;
}
