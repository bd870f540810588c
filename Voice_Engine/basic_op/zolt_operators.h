// How the ZOLT_ copy departs from the standard operators: every deviation is here, as an overload
// for ZoltFlags that replaces the template.
//
//  - its 16-bit arithmetic, its product and its rounding saturate silently; only L_sub, the carry
//    operators, L_sat and sature report;
//  - shr by a negative count wraps instead of saturating;
//  - its divisions end the process on operands out of range.
#pragma once

#include <cstdio>
#include <cstdlib>

#include "Voice_Engine/basic_op/operators.h"

namespace orvalis {

inline Word16 add(ZoltFlags &, Word16 a, Word16 b) {
  Flags unread;
  return add(unread, a, b);
}

inline Word16 sub(ZoltFlags &, Word16 a, Word16 b) {
  Flags unread;
  return sub(unread, a, b);
}

inline Word16 mult_r(ZoltFlags &, Word16 a, Word16 b) {
  Flags unread;
  return mult_r(unread, a, b);
}

inline Word32 L_mult(ZoltFlags &, Word16 a, Word16 b) {
  Flags unread;
  return L_mult(unread, a, b);
}

inline Word32 L_mac(ZoltFlags &, Word32 sum, Word16 a, Word16 b) {
  Flags unread;
  return L_mac(unread, sum, a, b);
}

inline Word16 round_BOP(ZoltFlags &, Word32 x) {
  Flags unread;
  return round_BOP(unread, x);
}

/// Left shifts keep the low 16 bits up to 15 places and saturate beyond.
inline Word16 shr(ZoltFlags &, Word16 x, Word32 n) {
  if (n >= 0) return shift_right(x, n);
  if (n >= -15) return extract_l(static_cast<Word32>(static_cast<std::uint32_t>(x) << -n));
  Flags unread;
  return shift_left(unread, x, -n);
}

/// Ends the process as the standard's division does. Status 0 is part of the interface.
[[noreturn]] inline void division_failed(const char *message) {
  std::puts(message);
  std::exit(0);
}

/// a / b in Q15, truncated, for 0 <= a <= b and b > 0. Any other operands are fatal.
inline Word16 div_s(ZoltFlags &, Word16 a, Word16 b) {
  if (a < 0 || a > b) division_failed("Division Error");
  if (b == 0) division_failed("Division by 0, Fatal error ");
  Flags unread;
  return div_s(unread, a, b);
}

/// a / (b * 2^16) in Q15, truncated and at most MAX_16, for a >= 0 and b > 0. Any other operands
/// are fatal. Source: ITU-T G.191 div_l.
inline Word16 div_l(Word32 a, Word16 b) {
  if (b == 0) division_failed("Division by 0 in div_l, Fatal error ");
  if (b < 0 || a < 0) division_failed("Division Error in div_l, Fatal error ");
  const Word32 divisor = L_deposit_h(b);
  if (a >= divisor) return MAX_16;
  // Both sides are halved before the fifteen restoring steps, so bit 0 of a does not count.
  return static_cast<Word16>((static_cast<Word64>(a >> 1) << 15) / (divisor >> 1));
}

/// a * b with a in Q31 and b in Q15, the low half unsigned. Source: ITU-T G.191 L_mls.
inline Word32 L_mls(ZoltFlags &flags, Word32 a, Word16 b) {
  return L_mac(flags, ((a & 0xFFFF) * b) >> 15, b, extract_h(a));
}

/// norm_s(x), at most max_shift; 0 counts as 15.
constexpr Word16 expadj_s(Word16 x, Word16 max_shift) {
  const Word16 shift = x == 0 ? Word16{15} : norm_s(x);
  return shift < max_shift ? shift : max_shift;
}

}  // namespace orvalis
