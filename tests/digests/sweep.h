// Functions of numbers over their range: all of it for one 16-bit operand, else every edge against
// every edge, a walk through the range, and operands of all sizes drawn at random.
#pragma once

#include <algorithm>
#include <limits>
#include <tuple>
#include <type_traits>
#include <vector>

#include "tests/digests/hostile.h"
#include "tests/digests/judge.h"
#include "tests/support/flag_words.h"

namespace orvalis::test {

/// Small numbers (shift counts), powers of two and their neighbours, the ends of the range.
template <class Word>
std::vector<Word> edge_values(int reach) {
  using Limits = std::numeric_limits<Word>;
  std::vector<Word> values{Limits::min(), Limits::max()};
  for (int n = -reach; n <= reach; ++n) values.push_back(static_cast<Word>(n));
  for (int bit = 2; bit < Limits::digits; ++bit) {
    for (const int near : {-1, 0, 1}) {
      const auto x = static_cast<Word>((Word{1} << bit) + near);
      values.push_back(x);
      values.push_back(static_cast<Word>(Word{} - x));
    }
  }
  return values;
}

/// The edges that as many operands can be crossed over.
template <class Word>
std::vector<Word> crossed_values(std::size_t operands) {
  using Limits = std::numeric_limits<Word>;
  if (operands > 4) return {Limits::min(), Word{1}, Limits::max(), static_cast<Word>(-5)};
  if (operands > 2)
    return {Limits::min(), Limits::min() / 2,     static_cast<Word>(-1), Word{0},
            Word{1},       Limits::max() / 2 + 1, Limits::max()};
  return edge_values<Word>(33);
}

/// All sizes of number, not only the large ones that plain random bits give.
template <class Word>
Word random_word(Random &random) {
  const std::uint64_t bits = random();
  return static_cast<Word>(static_cast<Word>(bits) >> (bits >> 40) % (8 * sizeof(Word)));
}

template <class Visit>
void cross(Visit visit) {
  visit();
}
template <class Visit, class List, class... Lists>
void cross(Visit visit, const List &first, const Lists &...rest) {
  for (const auto x : first) cross([&](auto... tail) { visit(x, tail...); }, rest...);
}

constexpr auto kEverywhere = [](auto...) { return true; };

/// Folds a function's results, and all flags that it leaves from standing ones of 0 and 1, into a
/// sequence. `defined` says which operands it may be called with.
template <class Result, class... Words, class Defined = decltype(kEverywhere)>
void sweep(Judge &judge, const std::string &name, Result (*function)(Words...),
           Defined defined = kEverywhere) {
  judge.sequence(name, [&] {
    constexpr int kBlock = 4096;
    int calls = 0;
    std::string block;
    const auto visit = [&](int standing, Words... operands) {
      if (!defined(operands...)) return;
      if (calls == 0) {
        block = "from operands";
        ((block += ' ' + std::to_string(operands)), ...);
      }
      write_flags(
          {standing & 1, standing >> 1, standing & 1, standing >> 1, standing & 1, standing >> 1});
      judge.take(function(operands...));
      std::uint64_t flags = 0;
      for (const int word : read_flags()) flags = 8 * flags + static_cast<unsigned>(word);
      judge.take(flags);
      if (++calls < kBlock) return;
      judge.call(block);
      calls = 0;
    };
    cross(
        [&](Words... operands) {
          for (const int standing : {0, 1, 2, 3}) visit(standing, operands...);
        },
        crossed_values<Words>(sizeof...(Words))...);
    if constexpr (sizeof...(Words) == 1) {
      using Word = std::tuple_element_t<0, std::tuple<Words...>>;
      using Unsigned = std::make_unsigned_t<Word>;
      constexpr auto kSteps = std::uint64_t{1} << (sizeof(Word) == 2 ? 16 : 17);
      constexpr auto kStep = std::numeric_limits<Unsigned>::max() / (kSteps - 1);
      for (std::uint64_t i = 0; i < kSteps; ++i)
        visit(i % 4, static_cast<Word>(static_cast<Unsigned>(i * kStep)));
    }
    Random random(2026);
    for (int i = 0; i < 1 << 16; ++i) {
      const std::tuple<Words...> operands{random_word<Words>(random)...};
      std::apply([&](Words... drawn) { visit(i % 4, drawn...); }, operands);
    }
    judge.call(block);
  });
}

}  // namespace orvalis::test
