// Logarithm, exponential and square root in fixed point.
// Sources: ITU-T G.729 (Log2), TIA IS-127 (all others).
#pragma once

#include <array>

#include "Voice_Engine/basic_op/hidden_table.h"
#include "Voice_Engine/basic_op/operators.h"

/// round(32768 * log2(1 + i/32)), the last entry clipped to 32767.
using Log2Table = std::array<orvalis::Word16, 33>;
ORVALIS_HIDDEN_TABLE(Log2Table, tablog);

namespace orvalis {

/// log2 of an integer: whole part and Q15 fraction.
struct Log2Result {
  Word16 exponent;
  Word16 fraction;
};

/// log2(x) for x > 0 by table and linear interpolation; (0, 0) for x <= 0.
inline Log2Result Log2(Flags &flags, Word32 x) {
  if (x <= 0) return {0, 0};
  const Word16 shift = norm_l(x);
  const Word16 exponent = sub(flags, 30, shift);
  const Word32 mantissa = x << shift;  // 1.0 is 2^30; bits 25..29 select the entry
  const Word16 position = sub(flags, extract_h(mantissa >> 9), 32);
  const auto weight = static_cast<Word16>((mantissa >> 10) & 0x7FFF);
  const Word16 *entry = &orvalis_tablog[position];
  const Word16 step = sub(flags, entry[0], entry[1]);
  return {exponent, extract_h(L_msu(flags, L_deposit_h(entry[0]), step, weight))};
}

/// log2(x / 2^31) in Q26 for x > 0, hence never positive; MAX_32 for 0.
inline Word32 fnLog2(Flags &flags, Word32 x) {
  if (x == 0) return MAX_32;
  const Word16 shift = norm_l(x);
  const Word16 mantissa = extract_h(L_shl(flags, x, shift));
  const Word16 exponent = negate(add(flags, shift, 1));
  // -0.3372 m^2 + 0.9982 m - 0.6626 fits log2(m) / 4 over 1/2..1. The error of the logarithm is
  // -0.0065..0.0088, of a level in dB -0.020..0.028. Adding 1 makes the fraction of the result.
  Word32 polynomial = L_mult(flags, mult_r(flags, mantissa, mantissa), -11050);
  polynomial = L_mac(flags, polynomial, mantissa, 32709);
  polynomial = L_add(flags, polynomial, L_deposit_h(-21712)) >> 3;
  return L_add(flags, polynomial & 0x03FFFFFF, L_deposit_h(shl(flags, exponent, 10)));
}

/// log10(x / 2^31) in Q26 for x > 0; MAX_32 for 0.
inline Word32 fnLog10(Flags &flags, Word32 x) {
  constexpr Word16 kLog10Of2 = 9864;  // Q15
  return x == 0 ? MAX_32 : L_mpy_ls(flags, fnLog2(flags, x), kLog10Of2);
}

/// 2^x in Q31 for x < 0 in Q26. For 0 it is one half; larger arguments have no defined result.
inline Word32 fnExp2(Flags &flags, Word32 x) {
  const Word32 split = L_mult(flags, extract_h(x), 32);
  const Word16 exponent = sub(flags, -1, extract_h(split));
  const Word32 fraction = L_add(flags, split & 0xFFFF, L_deposit_h(-1)) >> 1;
  const Word16 f = extract_l(fraction);
  // 0.1714 f^2 + 0.6675 f + 0.9980 fits 2^f over -1..0. The relative error is -0.27..0.37 %.
  Word32 polynomial = L_mult(flags, mult_r(flags, f, f), 5615);
  polynomial = L_mac(flags, polynomial, f, 21871);
  polynomial = L_add(flags, polynomial, L_deposit_h(32701));
  return exponent < 1 ? polynomial : L_shr(flags, polynomial, exponent);
}

/// 10^x in Q31 for x < 0 in Q26. For 0 it is one half; larger arguments have no defined result.
inline Word32 fnExp10(Flags &flags, Word32 x) {
  constexpr Word16 kLog2Of10 = 27213;  // Q13
  return fnExp2(flags, L_shl(flags, L_mpy_ls(flags, x, kLog2Of10), 2));
}

/// sqrt(x) in Q15 for a normalised x in Q31 (0.5 <= x < 1), by the Taylor series of sqrt(1 + 2h)
/// with h = (x - 1) / 2: 1 + h - h^2/2 + h^3/2 - 5 h^4/8 + 7 h^5/8. Every power is rounded before
/// the next. The error is below 0.0006.
inline Word16 sqroot(Flags &flags, Word32 x) {
  const Word32 half = L_sub(flags, L_shr(flags, x, 1), 0x40000000);
  const Word16 h = extract_h(half);
  Word32 sum = L_sub(flags, half, MIN_32);
  Word32 power = L_msu(flags, 0, h, h);  // -h^2
  sum = L_add(flags, sum, L_shr(flags, power, 1));
  power = L_msu(flags, 0, h, round_BOP(flags, power));  // h^3
  sum = L_add(flags, sum, L_shr(flags, power, 1));
  power = L_msu(flags, 0, h, round_BOP(flags, power));  // -h^4
  const Word16 fourth = round_BOP(flags, power);
  sum = L_mac(flags, sum, 0x5000, fourth);
  power = L_msu(flags, 0, h, fourth);  // h^5
  return mac_r(flags, sum, 0x7000, round_BOP(flags, power));
}

}  // namespace orvalis
