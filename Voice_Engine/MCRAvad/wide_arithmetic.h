// 64-bit fixed point: products and quotients that saturate, without integers wider than 64 bits.
//
// A 64-bit factor is taken apart into its signed upper and its unsigned lower 32 bits.
#pragma once

#include "Voice_Engine/basic_op/word.h"

namespace orvalis {

using UWord64 = std::uint64_t;

inline constexpr Word64 MAX_64 = INT64_MAX;
inline constexpr Word64 MIN_64 = INT64_MIN;

/// a + b modulo 2^64: the wrap-around is meant.
constexpr Word64 wrapping_add(Word64 a, Word64 b) {
  return static_cast<Word64>(static_cast<UWord64>(a) + static_cast<UWord64>(b));
}

/// a - b modulo 2^64: the wrap-around is meant.
constexpr Word64 wrapping_sub(Word64 a, Word64 b) {
  return static_cast<Word64>(static_cast<UWord64>(a) - static_cast<UWord64>(b));
}

constexpr Word64 upper_half(Word64 x) { return x >> 32; }
constexpr Word64 lower_half(Word64 x) { return x & 0xFFFFFFFF; }

constexpr Word32 saturated_word32(Word64 x) {
  if (x > MAX_32) return MAX_32;
  return x < MIN_32 ? MIN_32 : static_cast<Word32>(x);
}

/// |x|, MAX_64 for MIN_64.
constexpr Word64 L64_abs(Word64 x) {
  if (x == MIN_64) return MAX_64;
  return x < 0 ? -x : x;
}

/// x * 2^n, saturated, for n in 0..62.
constexpr Word64 L64_shl(Word64 x, int n) {
  if (x > MAX_64 >> n) return MAX_64;
  if (x < MIN_64 >> n) return MIN_64;
  return static_cast<Word64>(static_cast<UWord64>(x) << n);
}

/// x * w with w in Q31: rounded half up, saturated. Only MIN_32 * MIN_32 in the upper half can
/// saturate, and what the lower half adds never leads out of the range again.
constexpr Word64 L64_mult_q31(Word64 x, Word32 w) {
  constexpr Word64 kHalf = 0x40000000;
  return L64_shl(upper_half(x) * w, 1) + ((lower_half(x) * w + kHalf) >> 31);
}

/// floor(a * b / 2^32). The result is below 2^62 in magnitude.
constexpr Word64 L64_mult_by_word32(Word64 a, Word32 b) {
  return upper_half(a) * b + ((lower_half(a) * b) >> 32);
}

/// a * b in Q32, from the upper 63 bits of each factor. A product of the upper halves beyond the
/// range counts as the largest value, and the sum of all parts saturates.
constexpr Word64 L64_mult(Word64 a, Word64 b) {
  constexpr Word64 kLimit = Word64{1} << 31;
  const Word64 a_low = lower_half(a) >> 1;
  const Word64 b_low = lower_half(b) >> 1;
  Word64 upper = upper_half(a) * upper_half(b);
  Word64 lower = (a_low * b_low) >> 30;
  if (upper >= kLimit) {
    upper = kLimit - 1;
    lower += 0xFFFFFFFF;
  }
  // Each cross product is below 2^62. Their sum counts twice, so its bit 31 is the first whole one.
  const Word64 cross = a_low * upper_half(b) + b_low * upper_half(a);
  lower += (cross & (kLimit - 1)) * 2;
  upper += (cross >> 31) + (lower >> 32);
  if (upper >= kLimit) return MAX_64;
  if (upper < -kLimit) return MIN_64;
  return upper * (Word64{1} << 32) + lower_half(lower);
}

/// a * 2^kFractionBits / b, truncated toward zero and saturated, for b other than 0.
template <int kFractionBits>
constexpr Word64 L64_quotient(Word64 a, Word64 b) {
  const bool negative = (a < 0) != (b < 0);
  const UWord64 dividend = a < 0 ? -static_cast<UWord64>(a) : static_cast<UWord64>(a);
  const UWord64 divisor = b < 0 ? -static_cast<UWord64>(b) : static_cast<UWord64>(b);
  UWord64 quotient = 0;
  if (dividend >> (63 - kFractionBits) == 0) {
    quotient = (dividend << kFractionBits) / divisor;
  } else {
    quotient = dividend / divisor;
    if (quotient >> (63 - kFractionBits) != 0) return negative ? MIN_64 : MAX_64;
    UWord64 remainder = dividend % divisor;  // at most 2^63 - 1, so that it can be doubled
    for (int bit = 0; bit < kFractionBits; ++bit) {
      remainder *= 2;
      const bool fits = remainder >= divisor;
      quotient = quotient * 2 + fits;
      if (fits) remainder -= divisor;
    }
  }
  return negative ? -static_cast<Word64>(quotient) : static_cast<Word64>(quotient);
}

/// Root of an integer x >= 0, rounded up where the remainder is not below the root (also for 0,
/// which gives 1), at most MAX_32. The pairwise restoring method.
constexpr Word32 L64_root(Word64 x) {
  UWord64 remainder = static_cast<UWord64>(x);
  UWord64 root = 0;
  for (UWord64 bit = UWord64{1} << 62; bit != 0; bit >>= 2) {
    const UWord64 trial = root + bit;
    root >>= 1;
    if (remainder < trial) continue;
    remainder -= trial;
    root += bit;
  }
  if (remainder >= root) ++root;
  return saturated_word32(static_cast<Word64>(root));
}

}  // namespace orvalis
