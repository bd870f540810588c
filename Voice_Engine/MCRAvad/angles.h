// Sine, cosine and arctangent by table. Formats and accuracy: Math_baseop.h.
#pragma once

#include "Voice_Engine/basic_op/word.h"

namespace orvalis {

/// Sine in Q31 of an angle in Q22 radians.
Word32 sin_q31(Word32 angle);

/// Cosine in Q31 of an angle in Q22 radians.
Word32 cos_q31(Word32 angle);

/// Angle in Q22 radians of a tangent in Q11.
Word32 atan_q22(Word32 tangent);

/// Angle of the point (x, y) in Q22 radians, -pi to pi; 0 for the origin.
Word32 atan2_q22(Word32 y, Word32 x);

}  // namespace orvalis
