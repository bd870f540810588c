// The saturating basic operators of 16/32-bit fixed-point speech coding.
//
// Source: ITU-T G.191 Software Tool Library, basic operators, in their ITU-T G.729 form, and the
// fixed-point helpers of TIA IS-127 (EVRC).
//
// An operator that reports takes its flags as the first argument; one without touches no flag.
// Operators are templates over Flags and ZoltFlags; what is built on them takes Flags. Word16
// values are Q15 and Word32 values Q31 where they are fractions. Shift counts may have any size and
// give the mathematical result; a negative count shifts the other way.
#pragma once

#include <bit>

#include "Voice_Engine/basic_op/flags.h"
#include "Voice_Engine/basic_op/word.h"

namespace orvalis {

// --- Parts and deposits ------------------------------------------------------------------------

constexpr Word16 extract_h(Word32 x) { return static_cast<Word16>(x >> 16); }
constexpr Word16 extract_l(Word32 x) { return static_cast<Word16>(x); }
constexpr Word32 L_deposit_h(Word16 x) { return x * 65536; }
constexpr Word32 L_deposit_l(Word16 x) { return x; }

// --- Sign --------------------------------------------------------------------------------------

constexpr Word16 negate(Word16 x) { return x == MIN_16 ? MAX_16 : static_cast<Word16>(-x); }
constexpr Word16 abs_s(Word16 x) { return x < 0 ? negate(x) : x; }
constexpr Word32 L_negate(Word32 x) { return x == MIN_32 ? MAX_32 : -x; }
constexpr Word32 L_abs(Word32 x) { return x < 0 ? L_negate(x) : x; }

// --- 16-bit arithmetic: the overflow flag is set to 0 or 1 ---------------------------------------

/// Saturates to 16 bits; the overflow flag becomes 1 if the value did not fit, else 0.
template <class FlagSet>
inline Word16 sature(FlagSet &flags, Word32 x) {
  flags.overflow = x != extract_l(x);
  if (x > MAX_16) return MAX_16;
  if (x < MIN_16) return MIN_16;
  return extract_l(x);
}

template <class FlagSet>
inline Word16 add(FlagSet &flags, Word16 a, Word16 b) {
  return sature(flags, a + b);
}

template <class FlagSet>
inline Word16 sub(FlagSet &flags, Word16 a, Word16 b) {
  return sature(flags, a - b);
}

/// a * b in Q15, truncated.
template <class FlagSet>
inline Word16 mult(FlagSet &flags, Word16 a, Word16 b) {
  return sature(flags, (a * b) >> 15);
}

/// a * b in Q15, rounded half up.
template <class FlagSet>
inline Word16 mult_r(FlagSet &flags, Word16 a, Word16 b) {
  return sature(flags, (a * b + 0x4000) >> 15);
}

// --- 16-bit shifts: the overflow flag is only ever set -------------------------------------------

/// x >> n for n >= 0; sign bits fill in.
constexpr Word16 shift_right(Word16 x, Word32 n) {
  return static_cast<Word16>(x >> (n < 15 ? n : 15));
}

/// x << n for n >= 0, saturated.
template <class FlagSet>
inline Word16 shift_left(FlagSet &flags, Word16 x, Word32 n) {
  const Word32 wide = static_cast<Word32>(static_cast<std::uint32_t>(x) << (n < 16 ? n : 16));
  if (wide == extract_l(wide)) return extract_l(wide);
  flags.overflow = 1;
  return x > 0 ? MAX_16 : MIN_16;
}

template <class FlagSet>
inline Word16 shl(FlagSet &flags, Word16 x, Word32 n) {
  return n >= 0 ? shift_left(flags, x, n) : shift_right(x, -n);
}

template <class FlagSet>
inline Word16 shr(FlagSet &flags, Word16 x, Word32 n) {
  return n >= 0 ? shift_right(x, n) : shift_left(flags, x, -n);
}

/// Right shift rounded half up.
template <class FlagSet>
inline Word16 shr_r(FlagSet &flags, Word16 x, Word32 n) {
  if (n <= 0) return shift_left(flags, x, -n);
  if (n > 15) return 0;
  return static_cast<Word16>(shift_right(x, n) + ((x >> (n - 1)) & 1));
}

/// IS-127's rounding shift, left for n >= 0. Equals shr_r(x, -n), but clears the overflow flag on
/// its way right because it rounds with `add`.
template <class FlagSet>
inline Word16 shift_r(FlagSet &flags, Word16 x, Word32 n) {
  if (n >= 0) return shift_left(flags, x, n);
  if (n < -15) return 0;
  return add(flags, shift_right(x, -n), static_cast<Word16>(shift_right(x, -n - 1) & 1));
}

// --- 32-bit arithmetic: the overflow flag is only ever set ---------------------------------------

template <class FlagSet>
inline Word32 L_add(FlagSet &flags, Word32 a, Word32 b) {
  Word32 sum;
  if (!__builtin_add_overflow(a, b, &sum)) return sum;
  flags.overflow = 1;
  return a < 0 ? MIN_32 : MAX_32;
}

template <class FlagSet>
inline Word32 L_sub(FlagSet &flags, Word32 a, Word32 b) {
  Word32 difference;
  if (!__builtin_sub_overflow(a, b, &difference)) return difference;
  flags.overflow = 1;
  return a < 0 ? MIN_32 : MAX_32;
}

/// 2 * a * b: Q15 x Q15 gives Q31. Only MIN_16 * MIN_16 saturates.
template <class FlagSet>
inline Word32 L_mult(FlagSet &flags, Word16 a, Word16 b) {
  const Word32 product = a * b;
  if (product != 0x40000000) return product * 2;
  flags.overflow = 1;
  return MAX_32;
}

template <class FlagSet>
inline Word32 L_mac(FlagSet &flags, Word32 sum, Word16 a, Word16 b) {
  return L_add(flags, sum, L_mult(flags, a, b));
}

template <class FlagSet>
inline Word32 L_msu(FlagSet &flags, Word32 sum, Word16 a, Word16 b) {
  return L_sub(flags, sum, L_mult(flags, a, b));
}

/// The high half, rounded half up.
template <class FlagSet>
inline Word16 round_BOP(FlagSet &flags, Word32 x) {
  return extract_h(L_add(flags, x, 0x8000));
}

template <class FlagSet>
inline Word16 mac_r(FlagSet &flags, Word32 sum, Word16 a, Word16 b) {
  return round_BOP(flags, L_mac(flags, sum, a, b));
}

template <class FlagSet>
inline Word16 msu_r(FlagSet &flags, Word32 sum, Word16 a, Word16 b) {
  return round_BOP(flags, L_msu(flags, sum, a, b));
}

// --- Arithmetic with carry: the result wraps, the flags report it --------------------------------

/// a + b + Carry modulo 2^32. Carry out is that of the unsigned sum.
template <class FlagSet>
inline Word32 L_add_c(FlagSet &flags, Word32 a, Word32 b) {
  Word32 sum;
  const bool overflowed = __builtin_add_overflow(a, b, &sum);
  const bool carried = static_cast<std::uint32_t>(sum) < static_cast<std::uint32_t>(a);
  const Word32 result = wrapping_add(sum, flags.carry);
  flags.overflow = overflowed || (flags.carry != 0 && sum == MAX_32);
  flags.carry = carried || (flags.carry != 0 && sum == -1);
  return result;
}

/// a - b - 1 + Carry modulo 2^32, with the flags of the published form, which are not those of a
/// true subtraction for operands of different sign.
template <class FlagSet>
inline Word32 L_sub_c(FlagSet &flags, Word32 a, Word32 b) {
  const Word32 difference = wrapping_sub(a, b);
  if (flags.carry != 0) {
    flags.carry = 0;
    if (b != MIN_32) return L_add_c(flags, a, -b);
    if (a > 0) flags.overflow = 1;
    return difference;
  }
  if (difference < 0 && a > 0 && b < 0) {
    flags.overflow = 1;
  } else if (difference > 0 && a < 0 && b > 0) {
    flags.overflow = 1;
    flags.carry = 1;
  } else if (difference > 0 && (a ^ b) > 0) {
    flags.overflow = 0;
    flags.carry = 1;
  }
  if (difference == MIN_32) flags.overflow = 1;
  return wrapping_sub(difference, 1);
}

template <class FlagSet>
inline Word32 L_macNs(FlagSet &flags, Word32 sum, Word16 a, Word16 b) {
  return L_add_c(flags, sum, L_mult(flags, a, b));
}

template <class FlagSet>
inline Word32 L_msuNs(FlagSet &flags, Word32 sum, Word16 a, Word16 b) {
  return L_sub_c(flags, sum, L_mult(flags, a, b));
}

/// After carry arithmetic: x, or after an overflow the max or min, clearing both flags.
template <class FlagSet>
inline Word32 L_sat(FlagSet &flags, Word32 x) {
  if (flags.overflow == 0) return x;
  const Word32 saturated = flags.carry != 0 ? MIN_32 : MAX_32;
  flags.overflow = 0;
  flags.carry = 0;
  return saturated;
}

// --- 32-bit shifts -------------------------------------------------------------------------------

/// x >> n for n >= 0; sign bits fill in.
constexpr Word32 L_shift_right(Word32 x, Word32 n) { return x >> (n < 31 ? n : 31); }

/// x << n for n >= 0, saturated.
template <class FlagSet>
inline Word32 L_shift_left(FlagSet &flags, Word32 x, Word32 n) {
  if (n < 32) {
    const Word32 shifted = static_cast<Word32>(static_cast<std::uint32_t>(x) << n);
    if ((shifted >> n) == x) return shifted;
  } else if (x == 0) {
    return 0;
  }
  flags.overflow = 1;
  return x > 0 ? MAX_32 : MIN_32;
}

template <class FlagSet>
inline Word32 L_shl(FlagSet &flags, Word32 x, Word32 n) {
  return n >= 0 ? L_shift_left(flags, x, n) : L_shift_right(x, -n);
}

template <class FlagSet>
inline Word32 L_shr(FlagSet &flags, Word32 x, Word32 n) {
  return n >= 0 ? L_shift_right(x, n) : L_shift_left(flags, x, -n);
}

/// Right shift rounded half up.
template <class FlagSet>
inline Word32 L_shr_r(FlagSet &flags, Word32 x, Word32 n) {
  if (n <= 0) return L_shift_left(flags, x, -n);
  if (n > 31) return 0;
  return L_shift_right(x, n) + ((x >> (n - 1)) & 1);
}

// --- Normalisation and division ------------------------------------------------------------------

/// Left shifts that bring x to 0x4000..0x7FFF or 0x8000..0xBFFF; 0 for 0, 15 for -1.
constexpr Word16 norm_s(Word16 x) {
  const auto magnitude = static_cast<std::uint16_t>(x < 0 ? ~x : x);
  return x == 0 ? Word16{0} : static_cast<Word16>(std::countl_zero(magnitude) - 1);
}

/// Left shifts that normalise 32 bits; 0 for 0, 31 for -1.
constexpr Word16 norm_l(Word32 x) {
  const auto magnitude = static_cast<std::uint32_t>(x < 0 ? ~x : x);
  return x == 0 ? Word16{0} : static_cast<Word16>(std::countl_zero(magnitude) - 1);
}

/// a / b in Q15, truncated, for 0 < a <= b; 0 for any other operands.
/// For a < b the overflow flag becomes 0, as the fifteen steps of the division end in an `add`.
template <class FlagSet>
inline Word16 div_s(FlagSet &flags, Word16 a, Word16 b) {
  if (a <= 0 || a > b) return 0;
  if (a == b) return MAX_16;
  flags.overflow = 0;
  return static_cast<Word16>((a << 15) / b);
}

// --- IS-127 products and division ----------------------------------------------------------------

/// The low half of x as the unsigned Q15 fraction that the long products work with.
constexpr Word16 low_q15(Word32 x) { return static_cast<Word16>((x >> 1) & 0x7FFF); }

/// Q31 x Q31 gives Q31 (IS-127). The cross terms stay within 2^31: each is at most 2^30 - 2^15.
template <class FlagSet>
inline Word32 L_mpy_ll(FlagSet &flags, Word32 a, Word32 b) {
  const Word32 low = (low_q15(a) * low_q15(b)) >> 15;
  const Word32 middle = extract_h(a) * low_q15(b) + low + extract_h(b) * low_q15(a);
  return L_mac(flags, middle >> 14, extract_h(a), extract_h(b));
}

/// Q31 x Q15 gives Q31 (IS-127).
template <class FlagSet>
inline Word32 L_mpy_ls(FlagSet &flags, Word32 a, Word16 b) {
  return L_mac(flags, (b * low_q15(a)) >> 14, b, extract_h(a));
}

/// Q31 quotient a / b for 0 <= a <= b (IS-127: one Newton step on a 15-bit reciprocal); 0 for any
/// other operands.
template <class FlagSet>
inline Word32 L_divide(FlagSet &flags, Word32 a, Word32 b) {
  if (a > b || a < 0 || b < 0) return 0;
  const Word16 approximation = div_s(flags, 0x3FFF, extract_h(b));
  Word32 reciprocal = L_mpy_ls(flags, b, approximation);
  reciprocal = L_sub(flags, MAX_32, reciprocal);
  reciprocal = L_mpy_ls(flags, reciprocal, approximation);
  return L_shl(flags, L_mpy_ll(flags, a, reciprocal), 2);
}

}  // namespace orvalis
