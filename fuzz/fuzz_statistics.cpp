// Histograms and the statistics against a plain model, with histograms and counts that no image
// gives (wrapping sums, counts of 0 and counts below the total) and image sizes up to the int32
// extremes. Histograms sit between guards sized to exactly the bins the call may use.
#include <cstdint>
#include <cstring>
#include <vector>

#include "fuzz_support.h"
#include "kel_images.h"
#include "kel_outside.h"

namespace {

using kel_fuzz::Guarded;
using kel_fuzz::Reader;

uint32_t *bins(Guarded &g) {
  return reinterpret_cast<uint32_t *>(g.data());
}

uint8_t model_mean(const uint32_t *hist, uint32_t count) {
  uint32_t sum = 0;
  for (uint32_t i = 0; i < 256; ++i) sum += i * hist[i];
  return count == 0 ? 0 : static_cast<uint8_t>(sum / count);
}

uint16_t model_var(const uint32_t *hist, uint8_t mean, uint32_t count) {
  uint32_t sum = 0;
  for (uint32_t i = 0; i < 256; ++i) {
    const uint32_t d = i > mean ? i - mean : mean - i;
    sum += hist[i] * (d * d);
  }
  return count == 0 ? 0 : static_cast<uint16_t>(sum / count);
}

uint8_t model_std(uint16_t variance) {
  return static_cast<uint8_t>((tq_sqrt_24_5(uint32_t{variance} << 18) >> 2) & 255u);
}

void fuzz_histogram_routines(Reader &in) {
  Guarded hist(256 * sizeof(uint32_t));
  const uint8_t mode = in.byte();
  for (uint32_t i = 0; i < 256; ++i) {
    // Small counts most of the time, any 32-bit value (wrapping every sum) otherwise.
    uint32_t value = mode < 128 ? in.byte() % 4 : (mode < 192 ? in.u16() : in.u32());
    std::memcpy(hist.data() + i * 4, &value, 4);
  }
  std::vector<uint8_t> before(hist.data(), hist.data() + hist.size());
  const uint32_t count = in.size(4096);
  const uint8_t mean = in.byte() < 128 ? model_mean(bins(hist), count) : in.byte();

  KEL_CHECK(kel_hist_mean(bins(hist), count) == model_mean(bins(hist), count));
  const uint16_t variance = kel_hist_var(bins(hist), mean, count);
  KEL_CHECK(variance == model_var(bins(hist), mean, count));
  KEL_CHECK(kel_hist_std(bins(hist), mean, count) == model_std(variance));
  hist.check();
  KEL_CHECK(kel_fuzz::same_bytes(before.data(), hist.data(), hist.size()));
}

// Image sides: mostly small, sometimes extreme. The pixels read are height * width as a signed
// 32-bit product when that is positive, so the raster holds exactly that many.
int32_t image_side(Reader &in) {
  static constexpr int32_t kExtremes[] = {INT32_MIN, -65536, -46341, -2,    -1,
                                          0,         46341,  65536,  65537, INT32_MAX};
  const uint8_t selector = in.byte();
  if (selector < 210) return in.in_range(-4, 64);
  if (selector < 245) return kExtremes[selector % (sizeof kExtremes / sizeof kExtremes[0])];
  return in.i32();
}

void fuzz_image_routines(Reader &in) {
  const int32_t h = image_side(in), w = image_side(in);
  const uint32_t area = static_cast<uint32_t>(h) * static_cast<uint32_t>(w);
  const size_t n = area <= INT32_MAX ? area : 0;
  if (n > 64 * 64) return;
  Guarded src(n);
  in.pixels(src.data(), n);
  uint32_t full[256] = {};
  for (size_t i = 0; i < n; ++i) ++full[src.data()[i]];

  // The full histogram, and the reduced one with bits past 8 taken as 8.
  const uint32_t bits = in.byte() < 220 ? in.byte() % 9 : in.size(64);
  const uint32_t used = bits < 8 ? bits : 8;
  const uint32_t bin_count = uint32_t{1} << used;
  Guarded reduced((bin_count + 4) * sizeof(uint32_t));
  Guarded hist(256 * sizeof(uint32_t));
  in.pixels(reduced.data(), reduced.size());
  in.pixels(hist.data(), hist.size());
  std::vector<uint8_t> beyond(reduced.data() + bin_count * 4, reduced.data() + reduced.size());
  kel_image_histogram(src.data(), h, w, bins(hist));
  kel_image_histogram_n(src.data(), h, w, bits, bins(reduced));
  hist.check();
  reduced.check();
  KEL_CHECK(kel_fuzz::same_bytes(bins(hist), full, sizeof full));
  for (uint32_t b = 0; b < bin_count; ++b) {
    uint32_t expected = 0;
    for (uint32_t v = 0; v < 256; ++v) expected += (v >> (8 - used)) == b ? full[v] : 0;
    KEL_CHECK(bins(reduced)[b] == expected);
  }
  // Bins past 2^bits are left as they are.
  KEL_CHECK(kel_fuzz::same_bytes(beyond.data(), reduced.data() + bin_count * 4, beyond.size()));

  const uint8_t mean = model_mean(full, area);
  const uint16_t variance = model_var(full, mean, area);
  uint8_t mean_out = 0x5a, std_mean_out = 0xa5;
  const bool with_mean = in.byte() & 1;
  KEL_CHECK(kel_image_var(src.data(), h, w, with_mean ? &mean_out : nullptr) == variance);
  KEL_CHECK(kel_image_std(src.data(), h, w, with_mean ? &std_mean_out : nullptr) ==
            model_std(variance));
  KEL_CHECK(with_mean ? mean_out == mean && std_mean_out == mean
                      : mean_out == 0x5a && std_mean_out == 0xa5);
  src.check();
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size) {
  Reader in(data, size);
  if (in.byte() & 1) {
    fuzz_histogram_routines(in);
  } else {
    fuzz_image_routines(in);
  }
  return 0;
}
