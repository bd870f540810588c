#include "Voice_Engine/MCRAvad/angles.h"

#include <algorithm>
#include <array>

#include "Voice_Engine/MCRAvad/wide_arithmetic.h"
#include "Voice_Engine/basic_op/constexpr_math.h"
#include "Voice_Engine/basic_op/hidden_table.h"

namespace {

using orvalis::Word32;
using orvalis::Word64;
using orvalis::constexpr_math::cos_of_turn;
using orvalis::constexpr_math::sin_of_turn;

using TangentTable = std::array<Word32, 901>;
using SineTable = std::array<Word32, 403>;

/// tan(i / 10 degrees) in Q11; for 90 degrees that of 89.9999.
constexpr TangentTable make_tangents() {
  TangentTable table{};
  for (std::size_t i = 0; i + 1 < table.size(); ++i) {
    const auto position = static_cast<double>(i);
    const double tangent = sin_of_turn(position, 3600) / cos_of_turn(position, 3600);
    table[i] = static_cast<Word32>(0x1p11 * tangent + 0.5);
  }
  table.back() = 1171822423;
  return table;
}

/// sin(i / 256) in Q31, up to the last step before pi / 2.
constexpr SineTable make_sines() {
  constexpr double kStepsPerTurn = 512 * orvalis::constexpr_math::kPi;
  SineTable table{};
  for (std::size_t i = 0; i < table.size(); ++i) {
    const double sine = sin_of_turn(static_cast<double>(i), kStepsPerTurn);
    table[i] = static_cast<Word32>(0x1p31 * sine + 0.5);
  }
  return table;
}

}  // namespace

ORVALIS_HIDDEN_TABLE(TangentTable, ZOLT_atanList) = make_tangents();
ORVALIS_HIDDEN_TABLE(SineTable, ZOLT_sinList) = make_sines();

ORVALIS_EXPORT_TABLE(TangentTable, ZOLT_atanList);
ORVALIS_EXPORT_TABLE(SineTable, ZOLT_sinList);

namespace orvalis {
namespace {

// Q22.
constexpr Word32 kPi = 13176795;
constexpr Word32 kTwoPi = 26353590;
constexpr Word32 kHalfPi = 6588395;

}  // namespace

Word32 sin_q31(Word32 angle) {
  constexpr Word32 kFold = kHalfPi - 1;  // pi/2 itself folds too, onto the same entry
  constexpr Word32 kLastEntry = 402;
  Word32 reduced = angle % kTwoPi;
  if (reduced > kPi) {
    reduced -= kTwoPi;
  } else if (reduced <= -kPi) {
    reduced += kTwoPi;
  }
  Word32 magnitude = reduced < 0 ? -reduced : reduced;
  if (magnitude > kFold) magnitude = kPi - magnitude;
  const auto index = static_cast<std::size_t>(std::min(magnitude >> 14, kLastEntry));
  const Word32 sine = orvalis_ZOLT_sinList[index];
  return reduced < 0 ? -sine : sine;
}

Word32 cos_q31(Word32 angle) {
  // A quarter turn forward is three quarters back; one of the two cannot overflow.
  constexpr Word32 kThreeQuarters = 19765195;
  return sin_q31(angle > kHalfPi ? angle - kThreeQuarters : angle + kHalfPi);
}

Word32 atan_q22(Word32 tangent) {
  constexpr Word32 kTenthOfPi = 1317679;
  const TangentTable &table = orvalis_ZOLT_atanList;
  const Word32 magnitude = std::min(saturated_word32(L64_abs(tangent)), table.back());
  const auto above = std::upper_bound(table.begin(), table.end(), magnitude);
  const auto index = static_cast<Word32>(above - table.begin()) - 1;
  const Word32 angle = index * kTenthOfPi / 180;
  return tangent < 0 ? -angle : angle;
}

Word32 atan2_q22(Word32 y, Word32 x) {
  const Word64 height = L64_abs(y);
  const Word64 width = L64_abs(x);
  const Word64 shorter = std::min(height, width);
  const Word64 longer = std::max(height, width);
  // The tangent of the steeper angle: from 1 upward no two entries of the table are equal.
  const Word32 steep =
      shorter == 0 ? kHalfPi : atan_q22(saturated_word32((longer << 11) / shorter));
  Word32 angle = height > width ? steep : kHalfPi - steep;
  if (x < 0) angle = kPi - angle;
  return y < 0 ? -angle : angle;
}

}  // namespace orvalis
