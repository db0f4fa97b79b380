#include "wide_division.h"

namespace kel {

WideQuotient divide_wide_in_steps(uint64_t dividend, uint32_t divisor) {
  const auto high = static_cast<uint32_t>(dividend >> 32);
  const auto low = static_cast<uint32_t>(dividend);
  if (high == 0) return {low / divisor, low % divisor};
  // The high word divides on its own; its remainder (below the divisor) then takes the low
  // word's bits one at a time. remainder * 2 + 1 can pass 32 bits: the bit shifted out of the
  // top says the divisor fits, and the wrapped difference is then the true one.
  const uint32_t quotient_high = high / divisor;
  uint32_t remainder = high % divisor;
  uint32_t quotient_low = 0;
  for (int bit = 31; bit >= 0; --bit) {
    const bool overflow = (remainder >> 31) != 0;
    remainder = (remainder << 1) | ((low >> bit) & 1u);
    quotient_low <<= 1;
    if (overflow || remainder >= divisor) {
      remainder -= divisor;
      quotient_low |= 1u;
    }
  }
  return {(uint64_t{quotient_high} << 32) | quotient_low, remainder};
}

}  // namespace kel
