// Word types of the fixed-point engine, and what it assumes of the compiler.
#pragma once

#include <cstdint>
#include <limits>

namespace orvalis {

using Word16 = std::int16_t;
using Word32 = std::int32_t;
using Word64 = std::int64_t;

inline constexpr Word16 MAX_16 = INT16_MAX;
inline constexpr Word16 MIN_16 = INT16_MIN;
inline constexpr Word32 MAX_32 = INT32_MAX;
inline constexpr Word32 MIN_32 = INT32_MIN;

// docs/arithmetic.md lists where each of these is relied on.
static_assert((-3 >> 1) == -2, "right shift of a negative value is arithmetic");
static_assert(-7 / 2 == -3 && -7 % 2 == -1, "division truncates toward zero");
static_assert(static_cast<Word16>(0x18000) == MIN_16, "narrowing keeps the low bits");
static_assert(std::numeric_limits<float>::is_iec559 && std::numeric_limits<double>::is_iec559,
              "float and double are IEEE-754 single and double");

/// a + b modulo 2^32: the wrap-around is meant.
constexpr Word32 wrapping_add(Word32 a, Word32 b) {
  return static_cast<Word32>(static_cast<std::uint32_t>(a) + static_cast<std::uint32_t>(b));
}

/// a - b modulo 2^32: the wrap-around is meant.
constexpr Word32 wrapping_sub(Word32 a, Word32 b) {
  return static_cast<Word32>(static_cast<std::uint32_t>(a) - static_cast<std::uint32_t>(b));
}

/// The value of two's-complement digits, for constants that read best in hexadecimal.
constexpr Word32 word32(std::uint32_t digits) { return static_cast<Word32>(digits); }

/// Adds `step` to a counter, which stops at the maximum of its type.
template <class Counter>
constexpr void count_up(Counter &counter, int step = 1) {
  const Word64 next = static_cast<Word64>(counter) + step;
  constexpr Word64 last = sizeof(Counter) == 2 ? MAX_16 : MAX_32;
  counter = static_cast<Counter>(next < last ? next : last);
}

}  // namespace orvalis
