// Windows: values times weights, and the detector's tables of weights.
#pragma once

#include <array>

#include "Voice_Engine/MCRAvad/wide_arithmetic.h"
#include "Voice_Engine/basic_op/hidden_table.h"

using FrameWindow = std::array<orvalis::Word16, 160>;
using PeriodogramWindow = std::array<orvalis::Word32, 9>;
using SnrWindow = std::array<orvalis::Word32, 41>;

ORVALIS_HIDDEN_TABLE(FrameWindow, ZOLT_vadHamTable1);
ORVALIS_HIDDEN_TABLE(PeriodogramWindow, ZOLT_vadHamTable2);
ORVALIS_HIDDEN_TABLE(SnrWindow, ZOLT_vadHamTable3);

namespace orvalis {

/// x * w in Q15, rounded half up; -1 * -1 saturates.
constexpr Word16 weighted(Word16 x, Word16 w) {
  const Word32 product = (x * w + 0x4000) >> 15;
  return product > MAX_16 ? MAX_16 : static_cast<Word16>(product);
}

/// x * w in Q31, truncated; -1 * -1 saturates.
constexpr Word32 weighted(Word32 x, Word32 w) { return saturated_word32((Word64{x} * w) >> 31); }

/// x * w with w in Q31, rounded half up; the most negative product saturates.
constexpr Word64 weighted(Word64 x, Word32 w) { return L64_mult_q31(x, w); }

/// Weighs n values in place.
template <class Value, class Weight>
constexpr void apply_window(Word32 n, Value *x, const Weight *w) {
  for (Word32 i = 0; i < n; ++i) x[i] = weighted(x[i], w[i]);
}

}  // namespace orvalis
