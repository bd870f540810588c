// The exponential integral and the polynomial that decides how it is computed.
#pragma once

#include "Voice_Engine/basic_op/word.h"

namespace orvalis {

/// Nine coefficients in Q32, highest power first.
inline constexpr int kPolynomialTerms = 9;

/// Horner's value in Q32 after the first `terms` coefficients, at x in Q12.
Word64 polynomial_q32(const Word64 *coefficients, Word32 x, Word32 terms);

/// E1(|x|) in Q32 of x in Q12; 0 counts as 1/4096.
Word64 expint_q32(Word32 x);

}  // namespace orvalis
