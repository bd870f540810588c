// Compares an exported operator with its definition: value, own flags, and those of other copies.
#pragma once

#include <gtest/gtest.h>

#include <array>
#include <cstdint>
#include <limits>
#include <sstream>
#include <tuple>
#include <vector>

#include "definitions.h"
#include "tests/support/flag_words.h"
#include "tests/support/random.h"

namespace orvalis::test {

/// Zero, every power of two and its neighbours, both signs, all small numbers (shift counts).
template <class Word>
std::vector<Word> edges() {
  std::vector<Word> values;
  for (int n = -40; n <= 40; ++n) values.push_back(static_cast<Word>(n));
  for (int bit = 5; bit < static_cast<int>(8 * sizeof(Word)); ++bit)
    for (std::int64_t near = -1; near <= 1; ++near)
      for (const std::int64_t x :
           {(std::int64_t{1} << bit) + near, -(std::int64_t{1} << bit) + near})
        values.push_back(static_cast<Word>(std::clamp<std::int64_t>(
            x, std::numeric_limits<Word>::min(), std::numeric_limits<Word>::max())));
  return values;
}

template <class Word>
std::vector<Word> stepped(int step) {
  std::vector<Word> values = edges<Word>();
  for (int x = INT16_MIN; x <= INT16_MAX; x += step) values.push_back(static_cast<Word>(x));
  return values;
}

/// Denser for fewer operands: one 16-bit operand is swept, two are crossed in a grid.
template <class Word, int operands>
const std::vector<Word> &operand_values() {
  static const std::vector<Word> values = [] {
    constexpr Word top = std::numeric_limits<Word>::max(),
                   bottom = std::numeric_limits<Word>::min();
    const std::vector<Word> corners{bottom, bottom + 1, bottom / 2, -1, 0, 1, top / 2 + 1, top};
    if constexpr (operands > 3 || (operands == 3 && sizeof(Word) == 2)) return corners;
    if constexpr (operands == 1 && sizeof(Word) == 2) return stepped<Word>(1);
    if constexpr (operands == 2 && sizeof(Word) == 2) return stepped<Word>(241);
    return edges<Word>();
  }();
  return values;
}

template <class Visit>
void cross(Visit visit) {
  visit();
}
template <class Visit, class List, class... Lists>
void cross(Visit visit, const List &first, const Lists &...rest) {
  for (const auto x : first) cross([&](auto... tail) { visit(x, tail...); }, rest...);
}

/// All sizes of number, not only the large ones that plain random bits give.
template <class Word>
Word random_word(std::mt19937_64 &random) {
  const std::uint64_t bits = random();
  return static_cast<Word>(static_cast<Word>(bits) >> (bits >> 40) % (8 * sizeof(Word)));
}

inline std::mt19937_64 &shared_generator() {
  static std::mt19937_64 random = seeded_generator();
  return random;
}

/// Runs `operation` with both flags standing at 0 and 1. Stops at the first difference.
template <class Define, class Result, class... Words>
void expect_operator(const char *name, Copy copy, Result (*operation)(Words...), Define define) {
  bool agreed = true;
  const auto compare = [&](Words... operands) {
    for (int standing = 0; agreed && standing < 4; ++standing) {
      definition::Flags flags{standing & 1, standing >> 1};
      write_flags(flags_of(copy, flags.overflow, flags.carry));
      const std::int64_t got = operation(operands...);
      const FlagWords left = read_flags();
      const std::int64_t expected = define(flags, std::int64_t{operands}...);
      agreed = got == expected && left == flags_of(copy, flags.overflow, flags.carry);
      if (agreed) continue;
      std::ostringstream call;
      ((call << ' ' << operands), ...);
      ADD_FAILURE() << name << (copy == NS ? " (ns_)" : "") << call.str() << " with Overflow "
                    << (standing & 1) << ", Carry " << (standing >> 1) << ": " << got
                    << ", expected " << expected << "; flags " << testing::PrintToString(left)
                    << ", expected " << flags.overflow << ' ' << flags.carry;
    }
  };
  constexpr int operands = sizeof...(Words);
  cross(compare, operand_values<Words, operands>()...);
  for (int i = 0; i < 50000; ++i) {
    const std::tuple<Words...> drawn{random_word<Words>(shared_generator())...};
    std::apply(compare, drawn);
  }
}

}  // namespace orvalis::test
