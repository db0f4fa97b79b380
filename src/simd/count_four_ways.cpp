// The 256-bin histogram of the vector targets: scalar, compiled once for the baseline instruction
// set, and entered in each target's kernel table.
#include <cstddef>
#include <cstdint>
#include <cstring>

namespace kel {
namespace simd {

// A run of one value would make every increment wait for the store of the one before, so
// consecutive pixels go to four histograms in turn -- the caller's and three on the stack (3 KiB
// at most) -- that are added at the end. Eight pixels are read as one word, so the stores to
// the histograms never have to be checked against the next pixels' loads; which byte of the
// word goes to which histogram does not change the sums. Written out by hand, as compilers do
// not unroll the lanes. Returns how many pixels it counted: whole words.
// kFull: all 8 bits, a case of its own so that the shift of every pixel is compiled out.
template <bool kFull>
size_t count_four_ways(const uint8_t *pixels, size_t count, uint32_t bits, uint32_t *hist) {
  const uint32_t shift = kFull ? 0 : 8 - bits;
  const uint32_t bins = uint32_t{1} << bits;
  uint32_t lane1[256], lane2[256], lane3[256];
  for (uint32_t bin = 0; bin < bins; ++bin) lane1[bin] = lane2[bin] = lane3[bin] = 0;
  const auto bin_of = [&](uint64_t word, unsigned byte) {
    return static_cast<uint32_t>((word >> (8 * byte)) & 0xFF) >> shift;
  };
  size_t i = 0;
  for (; count - i >= 8; i += 8) {
    uint64_t word;
    std::memcpy(&word, pixels + i, sizeof word);
    ++hist[bin_of(word, 0)];
    ++lane1[bin_of(word, 1)];
    ++lane2[bin_of(word, 2)];
    ++lane3[bin_of(word, 3)];
    ++hist[bin_of(word, 4)];
    ++lane1[bin_of(word, 5)];
    ++lane2[bin_of(word, 6)];
    ++lane3[bin_of(word, 7)];
  }
  // No bin can overflow: count is below 2^31.
  for (uint32_t bin = 0; bin < bins; ++bin) hist[bin] += lane1[bin] + lane2[bin] + lane3[bin];
  return i;
}

size_t count_bins_four_ways(const uint8_t *pixels, size_t count, uint32_t bits, uint32_t *hist) {
  return bits == 8 ? count_four_ways<true>(pixels, count, bits, hist)
                   : count_four_ways<false>(pixels, count, bits, hist);
}

}  // namespace simd
}  // namespace kel
