// Cube root and 1.5th root. Formats and accuracy: Math_baseop.h.
#pragma once

#include "Voice_Engine/basic_op/word.h"

namespace orvalis {

/// x^(1/3), Q31 to Q31, with the sign of x.
Word32 cube_root_q31(Word32 x);

/// |x|^(2/3), Q31 to Q31, with the sign of x.
Word32 root15_q31(Word32 x);

}  // namespace orvalis
