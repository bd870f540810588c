// 32-bit values as pairs (hi, lo) of 16-bit words: value = hi * 2^16 + lo * 2, lo in 0..32767.
// Source: ITU-T G.729, oper_32b.
#pragma once

#include "Voice_Engine/basic_op/operators.h"

namespace orvalis {

/// A 32-bit value in double-precision format.
struct DoubleWord {
  Word16 hi;
  Word16 lo;
};

inline DoubleWord L_Extract(Flags &flags, Word32 x) {
  const Word16 hi = extract_h(x);
  return {hi, extract_l(L_msu(flags, x >> 1, hi, 16384))};
}

inline Word32 L_Comp(Flags &flags, DoubleWord x) {
  return L_mac(flags, L_deposit_h(x.hi), x.lo, 1);
}

/// Q31 x Q31 gives Q31.
inline Word32 Mpy_32(Flags &flags, DoubleWord a, DoubleWord b) {
  Word32 product = L_mult(flags, a.hi, b.hi);
  product = L_mac(flags, product, mult(flags, a.hi, b.lo), 1);
  return L_mac(flags, product, mult(flags, a.lo, b.hi), 1);
}

/// Q31 x Q15 gives Q31.
inline Word32 Mpy_32_16(Flags &flags, DoubleWord a, Word16 b) {
  const Word32 product = L_mult(flags, a.hi, b);
  return L_mac(flags, product, mult(flags, a.lo, b), 1);
}

/// Q31 quotient for 0 <= numerator < denominator, denominator normalised (hi >= 0x4000).
inline Word32 Div_32(Flags &flags, Word32 numerator, DoubleWord denominator) {
  const Word16 approximation = div_s(flags, 0x3FFF, denominator.hi);
  Word32 reciprocal = Mpy_32_16(flags, denominator, approximation);
  reciprocal = L_sub(flags, MAX_32, reciprocal);
  reciprocal = Mpy_32_16(flags, L_Extract(flags, reciprocal), approximation);
  const DoubleWord factor = L_Extract(flags, reciprocal);
  return L_shl(flags, Mpy_32(flags, L_Extract(flags, numerator), factor), 2);
}

}  // namespace orvalis
