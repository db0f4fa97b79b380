// Division of a 64-bit value by a 32-bit one in 32-bit steps. Small targets (Cortex-M) divide 32
// bits in hardware but would call a library routine of several hundred bytes for 64 bits; this
// gives the same quotient and remainder with 32-bit divisions and, where the dividend passes 32
// bits, one shift-and-subtract step per low bit.
#ifndef KEL_WIDE_DIVISION_H_
#define KEL_WIDE_DIVISION_H_

#include <cstdint>

namespace kel {

struct WideQuotient {
  uint64_t quotient;
  uint32_t remainder;
};

// divisor must not be 0.
WideQuotient divide_wide(uint64_t dividend, uint32_t divisor);

}  // namespace kel

#endif  // KEL_WIDE_DIVISION_H_
