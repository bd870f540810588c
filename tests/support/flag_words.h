// The six process-wide flag words as one value, to check who changes which.
#pragma once

#include <array>

#include "basic_op.h"

namespace orvalis::test {

/// Overflow and carry of the plain, the ns_ and the ZOLT_ copy.
using FlagWords = std::array<int, 6>;

inline FlagWords read_flags() {
  return {Overflow, Carry, ns_Overflow, ns_Carry, Overflow_ZOLT, Carry_ZOLT};
}

inline void write_flags(const FlagWords &words) {
  Overflow = words[0];
  Carry = words[1];
  ns_Overflow = words[2];
  ns_Carry = words[3];
  Overflow_ZOLT = static_cast<int16_t>(words[4]);
  Carry_ZOLT = static_cast<int16_t>(words[5]);
}

}  // namespace orvalis::test
