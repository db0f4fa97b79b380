// Division of a 64-bit value by a 32-bit one. 32-bit targets (Cortex-M) divide 32 bits in
// hardware but would call a library routine of several hundred bytes for 64 bits; they take the
// same quotient and remainder in 32-bit steps instead. 64-bit machines divide in one instruction.
#ifndef KEL_WIDE_DIVISION_H_
#define KEL_WIDE_DIVISION_H_

#include <cstdint>

namespace kel {

struct WideQuotient {
  uint64_t quotient;
  uint32_t remainder;
};

// With 32-bit divisions and, where the dividend passes 32 bits, one shift-and-subtract step per
// low bit. divisor must not be 0.
WideQuotient divide_wide_in_steps(uint64_t dividend, uint32_t divisor);

// divisor must not be 0.
inline WideQuotient divide_wide(uint64_t dividend, uint32_t divisor) {
#if UINTPTR_MAX > UINT32_MAX
  return {dividend / divisor, static_cast<uint32_t>(dividend % divisor)};
#else
  return divide_wide_in_steps(dividend, divisor);
#endif
}

}  // namespace kel

#endif  // KEL_WIDE_DIVISION_H_
