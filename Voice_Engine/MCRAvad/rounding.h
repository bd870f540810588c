// Rounded products, shifts and halves of the MCRA detector. None overflows.
#pragma once

#include "Voice_Engine/MCRAvad/wide_arithmetic.h"

namespace orvalis {

/// x * w in Q31, rounded half up.
constexpr Word32 mult_q31(Word32 x, Word32 w) {
  return saturated_word32((Word64{x} * w + 0x40000000) >> 31);
}

constexpr Word32 saturated_sum(Word32 a, Word32 b) { return saturated_word32(Word64{a} + b); }

/// x / 2^shift, rounded half up, for a shift of 1 and more.
constexpr Word64 rounded_shift_right(Word64 x, int shift) {
  return (x >> shift) + ((x >> (shift - 1)) & 1);
}

/// x / 2, the odd unit rounded away from zero.
constexpr Word64 rounded_half(Word64 x) { return x / 2 + x % 2; }

/// a * b, saturated, for a >= 0 and b > 0.
constexpr Word64 saturated_product(Word64 a, Word64 b) { return a > MAX_64 / b ? MAX_64 : a * b; }

}  // namespace orvalis
