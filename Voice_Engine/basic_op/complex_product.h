// Products of complex numbers, real and imaginary part apart. Source: TIA IS-127.
#pragma once

#include "Voice_Engine/basic_op/operators.h"

namespace orvalis {

/// Real part of a * b for Q15 parts, in Q31.
inline Word32 C2PREAL_SS(Flags &flags, Word16 ar, Word16 ai, Word16 br, Word16 bi) {
  const Word32 first = L_mult(flags, ar, br);
  return L_sub(flags, first, L_mult(flags, ai, bi));
}

/// Imaginary part of a * b for Q15 parts, in Q31.
inline Word32 C2PIMAG_SS(Flags &flags, Word16 ar, Word16 ai, Word16 br, Word16 bi) {
  const Word32 first = L_mult(flags, ar, bi);
  return L_add(flags, first, L_mult(flags, ai, br));
}

/// Real part of a * b for a in Q31 and b in Q15, in Q31.
inline Word32 C2PREAL_LS(Flags &flags, Word32 ar, Word32 ai, Word16 br, Word16 bi) {
  const Word32 first = L_mpy_ls(flags, ar, br);
  return L_sub(flags, first, L_mpy_ls(flags, ai, bi));
}

/// Imaginary part of a * b for a in Q31 and b in Q15, in Q31.
inline Word32 C2PIMAG_LS(Flags &flags, Word32 ar, Word32 ai, Word16 br, Word16 bi) {
  const Word32 first = L_mpy_ls(flags, ar, bi);
  return L_add(flags, first, L_mpy_ls(flags, ai, br));
}

/// A complex number in Q31.
struct Complex32 {
  Word32 re;
  Word32 im;
};

/// a * b in Q31.
inline Complex32 complex_product(Flags &flags, Complex32 a, Complex32 b) {
  const Word32 rr = L_mpy_ll(flags, a.re, b.re);
  const Word32 re = L_sub(flags, rr, L_mpy_ll(flags, a.im, b.im));
  const Word32 ri = L_mpy_ll(flags, a.re, b.im);
  return {re, L_add(flags, ri, L_mpy_ll(flags, a.im, b.re))};
}

/// Real part of (a * b) * c in Q31.
inline Word32 C3PREAL(Flags &flags, Complex32 a, Complex32 b, Complex32 c) {
  const Complex32 ab = complex_product(flags, a, b);
  const Word32 first = L_mpy_ll(flags, ab.re, c.re);
  return L_sub(flags, first, L_mpy_ll(flags, ab.im, c.im));
}

/// Imaginary part of (a * b) * c in Q31.
inline Word32 C3PIMAG(Flags &flags, Complex32 a, Complex32 b, Complex32 c) {
  const Complex32 ab = complex_product(flags, a, b);
  const Word32 first = L_mpy_ll(flags, ab.re, c.im);
  return L_add(flags, first, L_mpy_ll(flags, ab.im, c.re));
}

}  // namespace orvalis
