// The basic operators over lanes of 32 bits, for what is computed once for every channel.
//
// Words is a vector of the compiler's where the processor shifts each lane by a count of its own
// (AVX2), else a single Word32. Lanes hold values of 16 or of 32 bits. The names are those of the
// operators and functions of operators.h and log_exp.h, whose results these have for the ranges
// that are stated; there nothing saturates but what says so.
#pragma once

#include <bit>

#include "Voice_Engine/basic_op/lanes.h"
#include "Voice_Engine/basic_op/operators.h"

namespace orvalis::ORVALIS_BODY {

// --- What differs between one lane and many ------------------------------------------------------

#ifdef __AVX2__

using Words = Word32 __attribute__((vector_size(32)));
inline constexpr int kWords = 8;

inline Words load_words(const Word32 *x) {
  Words words;
  __builtin_memcpy(&words, x, sizeof words);
  return words;
}
inline void store_words(Word32 *x, Words words) { __builtin_memcpy(x, &words, sizeof words); }

inline Words wrapping_shift_left(Words x, Words n) {
  using Unsigned = std::uint32_t __attribute__((vector_size(32)));
  return reinterpret_cast<Words>(reinterpret_cast<Unsigned>(x) << reinterpret_cast<Unsigned>(n));
}

inline Words norm_l(Words x) {
  using Floats = float __attribute__((vector_size(32)));
  // Without the bit below the highest one, rounding to float does not carry into the exponent.
  const Floats rounded = __builtin_convertvector(x & ~(x >> 1), Floats);
  const Words norm = (127 + 30) - (reinterpret_cast<Words>(rounded) >> 23);
  return x == 0 ? Words{} : norm;
}

/// (0x3FFF << 15) / b for b = 0x4000..0x7FFF.
inline Words reciprocal_q30(Words b) {
  using Floats = float __attribute__((vector_size(32)));
  constexpr Word32 kDividend = 0x3FFF << 15;
  const Floats quotient = static_cast<float>(kDividend) / __builtin_convertvector(b, Floats);
  const Words rounded = __builtin_convertvector(quotient, Words);  // at most 1 too large
  return rounded + (rounded * b > kDividend);
}

#else

using Words = Word32;
inline constexpr int kWords = 1;

inline Words load_words(const Word32 *x) { return *x; }
inline void store_words(Word32 *x, Words word) { *x = word; }
inline Words wrapping_shift_left(Words x, Words n) {
  return static_cast<Word32>(static_cast<std::uint32_t>(x) << n);
}
inline Words norm_l(Words x) { return orvalis::norm_l(x); }
inline Words reciprocal_q30(Words b) { return (0x3FFF << 15) / b; }

#endif

// --- Shifts and products -------------------------------------------------------------------------

inline Words smaller(Words a, Words b) { return a < b ? a : b; }
inline Words larger(Words a, Words b) { return a > b ? a : b; }
inline Words broadcast_words(Word32 x) { return Words{} + x; }

/// For a, b >= 0; saturates.
inline Words L_add(Words a, Words b) {
  const Words room = MAX_32 - a;
  return b > room ? broadcast_words(MAX_32) : a + smaller(b, room);
}

/// For x >= 0 and n = 0..31; saturates.
inline Words L_shift_left(Words x, Words n) {
  const Words shifted = wrapping_shift_left(x, n);
  return (shifted >> n) == x ? shifted : broadcast_words(MAX_32);
}

/// For x >= 0 and n = -31..31 or more; saturates.
inline Words L_shr(Words x, Words n) {
  const Words right = x >> smaller(larger(n, Words{}), broadcast_words(31));
  return n < 0 ? L_shift_left(x, larger(-n, Words{})) : right;
}

/// Left where n > 0.
inline Words L_shl(Words x, Words n) { return L_shr(x, -n); }

/// Q31 x Q15.
inline Words L_mpy_ls(Words a, Words b) {
  return ((b * ((a >> 1) & 0x7FFF)) >> 14) + 2 * (b * (a >> 16));
}

/// Q31 x Q31.
inline Words L_mpy_ll(Words a, Words b) {
  const Words a_low = (a >> 1) & 0x7FFF;
  const Words b_low = (b >> 1) & 0x7FFF;
  const Words middle = (a >> 16) * b_low + ((a_low * b_low) >> 15) + (b >> 16) * a_low;
  return (middle >> 14) + 2 * ((a >> 16) * (b >> 16));
}

/// Q31 quotient for 0 <= a < b, b normalised; saturates. 0 for b = 0.
inline Words L_divide(Words a, Words b) {
  const Words approximation = reciprocal_q30(larger(b >> 16, broadcast_words(0x4000)));
  const Words error = MAX_32 - L_mpy_ls(b, approximation);
  const Words quotient =
      L_shift_left(L_mpy_ll(a, L_mpy_ls(error, approximation)), broadcast_words(2));
  return a > b ? Words{} : quotient;
}

inline Words mult_r(Words a, Words b) { return (a * b + 0x4000) >> 15; }

// --- Logarithm and exponential -------------------------------------------------------------------

/// For x > 0.
inline Words fnLog10(Words x) {
  constexpr Word32 kLog10Of2 = 9864;  // Q15
  const Words shift = norm_l(x);
  const Words mantissa = wrapping_shift_left(x, shift) >> 16;
  const Words polynomial =
      (2 * mult_r(mantissa, mantissa) * -11050 + 2 * mantissa * 32709 - 21712 * 65536) >> 3;
  const Words log2 = (polynomial & 0x03FFFFFF) - (shift + 1) * (1 << 26);
  return L_mpy_ls(log2, broadcast_words(kLog10Of2));
}

/// For x = -2^28 (10^-4) to -1.
inline Words fnExp10(Words x) {
  constexpr Word32 kLog2Of10 = 27213;  // Q13
  const Words log2 = L_mpy_ls(x, broadcast_words(kLog2Of10)) * 4;
  const Words split = (log2 >> 16) * 64;
  const Words exponent = -1 - (split >> 16);
  const Words f = ((split & 0xFFFF) - 65536) >> 1;
  const Words square = smaller(mult_r(f, f), broadcast_words(MAX_16));
  const Words polynomial = 2 * square * 5615 + 2 * f * 21871 + 32701 * 65536;
  return polynomial >> larger(exponent, Words{});
}

}  // namespace orvalis::ORVALIS_BODY
