// Natural logarithm, power of two, exponential and general power. Formats: Math_baseop.h.
#pragma once

#include <array>

#include "Voice_Engine/basic_op/hidden_table.h"
#include "Voice_Engine/basic_op/word.h"

namespace orvalis {

/// Where the printed messages of fatal conditions place them.
inline constexpr char kMathSource[] = "Voice_Engine/MCRAvad/Math_baseop";

/// ln(x) in Q26 of x in Q16; MIN_32 for 0.
Word32 ln_q26(std::uint32_t x);

/// ln(x) in Q11 of x in Q16; MIN_16 for 0.
Word16 ln_q11(std::uint32_t x);

/// How many table lookups make a power of two.
enum class Lookup { kOne, kTwo };

/// 2^(x / 2^q) in Qout for x >= 0 and x / 2^q < 32768. Any other exponent ends the process.
Word32 pow2(Word32 x, Word16 q, Word16 out_q, Lookup lookup);

/// e^x in Q32 of x in Q26; 0 below -21, a constant above 21.
Word64 exp_q32(Word32 x);

/// x^y in Q15 of x in Q15 and y in Q31.
Word32 pow_q15(Word32 x, Word32 y);

}  // namespace orvalis
