// Twiddle factors and stage steps, made at compile time, and the plans that use them.
#include <array>
#include <utility>

#include "Voice_Engine/basic_op/constexpr_math.h"
#include "Voice_Engine/basic_op/hidden_table.h"
#include "Voice_Engine/basic_op/operators.h"
#include "Voice_Engine/channel/fixed_fft_kernel.h"

namespace {

using orvalis::Word16;
using orvalis::constexpr_math::cos_of_turn;
using orvalis::constexpr_math::rounded_word16;
using orvalis::constexpr_math::sin_of_turn;

template <std::size_t kSize>
using Table = std::array<Word16, kSize>;

template <std::size_t kSize, class ToWord>
constexpr Table<kSize> make_twiddles(ToWord to_word) {
  Table<kSize> table{};
  for (std::size_t i = 0; i < kSize / 2; ++i) {
    table[2 * i] = to_word(cos_of_turn(static_cast<double>(i), kSize));
    table[2 * i + 1] = to_word(-sin_of_turn(static_cast<double>(i), kSize));
  }
  return table;
}

// Detector and suppressor round their tables differently, and every bit counts.
constexpr auto kRounded = [](double x) { return rounded_word16(32768 * x); };
constexpr auto kTruncated = [](double x) { return static_cast<Word16>(32767 * x); };

template <std::size_t kStages>
constexpr Table<kStages> make_steps() {
  Table<kStages> table{};
  for (std::size_t stage = 0; stage < kStages; ++stage) {
    table[stage] = static_cast<Word16>(1 << (kStages - stage));
  }
  return table;
}

using Table256 = Table<256>;
using Table128 = Table<128>;
using Steps7 = Table<7>;
using Steps6 = Table<6>;
using BandPointers = std::array<const Word16 *, 2>;

}  // namespace

ORVALIS_HIDDEN_TABLE(Table256, phs_tbl_WB) = make_twiddles<256>(kRounded);
ORVALIS_HIDDEN_TABLE(Table128, phs_tbl_NB) = make_twiddles<128>(kRounded);
ORVALIS_HIDDEN_TABLE(Table256, phs_tbl_256) = make_twiddles<256>(kTruncated);
ORVALIS_HIDDEN_TABLE(Steps7, ii_table_WB) = make_steps<7>();
ORVALIS_HIDDEN_TABLE(Steps6, ii_table_NB) = make_steps<6>();
ORVALIS_HIDDEN_TABLE(Steps7, ii_table_256) = make_steps<7>();
ORVALIS_HIDDEN_TABLE(BandPointers, phs_tbl) = {orvalis_phs_tbl_WB.data(),
                                               orvalis_phs_tbl_NB.data()};
ORVALIS_HIDDEN_TABLE(BandPointers, ii_table) = {orvalis_ii_table_WB.data(),
                                                orvalis_ii_table_NB.data()};

ORVALIS_EXPORT_TABLE(Table256, phs_tbl_WB);
ORVALIS_EXPORT_TABLE(Table128, phs_tbl_NB);
ORVALIS_EXPORT_TABLE(Table256, phs_tbl_256);
ORVALIS_EXPORT_TABLE(Steps7, ii_table_WB);
ORVALIS_EXPORT_TABLE(Steps6, ii_table_NB);
ORVALIS_EXPORT_TABLE(Steps7, ii_table_256);
ORVALIS_EXPORT_TABLE(BandPointers, phs_tbl);
ORVALIS_EXPORT_TABLE(BandPointers, ii_table);

namespace orvalis {
namespace {

/// Twiddle factors in the pairs in which lanes use them.
template <std::size_t kSize>
struct LaneTables {
  static constexpr std::size_t kBins = kSize / 4;

  struct Split {
    Table<2 * kBins> low_re, low_im, high_re, high_im;
  };

  Table<kSize - 2> minus_cos_sin{};
  Table<kSize - 2> sin_cos{};
  Table<128> halves_minus_cos_sin{};
  Table<128> halves_sin_cos{};
  Split split[2]{};

  explicit constexpr LaneTables(const Table<kSize> &twiddles) {
    std::size_t at = 0;
    for (std::size_t factors = 1; factors < kSize / 2; factors *= 2) {
      for (std::size_t j = 0; j < factors; ++j, at += 2)
        put_rotation(twiddles, j * kSize / (2 * factors), at, minus_cos_sin, sin_cos);
    }
    for (std::size_t lane = 0; lane < 64; ++lane) {
      const std::size_t vector = lane / 8;
      const std::size_t j = (vector & 1) * 4 + (vector & 2) + vector / 4;
      put_rotation(twiddles, j * kSize / 16, 2 * lane, halves_minus_cos_sin, halves_sin_cos);
    }
    for (std::size_t k = 1; k <= kBins; ++k) {
      const Word16 c = twiddles[2 * k];
      const Word16 s = twiddles[2 * k + 1];
      const Word16 high_c = twiddles[kSize - 2 * k];
      const Word16 high_s = twiddles[kSize - 2 * k + 1];
      // The inverse turns the other way. The middle bin, where a sine may have no negative, is
      // computed apart.
      for (Split &to : split) {
        const bool forward = &to == &split[0];
        const Word16 turn = forward ? s : negate(s);
        const Word16 high_turn = forward ? high_s : negate(high_s);
        put_pair(to.low_re, k - 1, c, negate(turn));
        put_pair(to.low_im, k - 1, turn, c);
        put_pair(to.high_re, k - 1, high_c, high_turn);
        put_pair(to.high_im, k - 1, high_turn, negate(high_c));
      }
    }
  }

  /// The same for vectors of 16, whose halves are unpacked side by side: of each 16 pairs, 0..3 and
  /// 8..11 come first. Stages of fewer factors do not load vectors.
  constexpr LaneTables for_lanes16() const {
    constexpr std::size_t kStagesBelow = 2 * (1 + 2 + 4 + 8);
    LaneTables tables = *this;
    interleave_halves(tables.minus_cos_sin, kStagesBelow);
    interleave_halves(tables.sin_cos, kStagesBelow);
    interleave_halves(tables.halves_minus_cos_sin, 0);
    interleave_halves(tables.halves_sin_cos, 0);
    for (Split &of : tables.split) {
      for (auto *pairs : {&of.low_re, &of.low_im, &of.high_re, &of.high_im})
        interleave_halves(*pairs, 0);
    }
    return tables;
  }

private:
  template <class Pairs>
  static constexpr void interleave_halves(Pairs &pairs, std::size_t from) {
    for (; from < pairs.size(); from += 32) {
      // Words 8..15 and 16..23 change places.
      for (std::size_t i = from + 8; i < from + 16; ++i) std::swap(pairs[i], pairs[i + 8]);
    }
  }
  template <class Pairs>
  static constexpr void put_pair(Pairs &pairs, std::size_t at, Word16 first, Word16 second) {
    pairs[2 * at] = first;
    pairs[2 * at + 1] = second;
  }
  template <class Pairs>
  static constexpr void put_rotation(const Table<kSize> &twiddles, std::size_t factor,
                                     std::size_t at, Pairs &minus_cos_sin, Pairs &sin_cos) {
    const Word16 c = twiddles[2 * factor];
    const Word16 s = twiddles[2 * factor + 1];
    put_pair(minus_cos_sin, at / 2, negate(c), s);
    put_pair(sin_cos, at / 2, s, c);
  }
};

template <std::size_t kSize>
constexpr LaneFactors factors_of(const LaneTables<kSize> &tables) {
  const auto split = [](const auto &of) {
    return SplitFactors{of.low_re.data(), of.low_im.data(), of.high_re.data(), of.high_im.data()};
  };
  return {tables.minus_cos_sin.data(),
          tables.sin_cos.data(),
          tables.halves_minus_cos_sin.data(),
          tables.halves_sin_cos.data(),
          {split(tables.split[0]), split(tables.split[1])}};
}

constexpr LaneTables<256> kWide8(make_twiddles<256>(kRounded));
constexpr LaneTables<256> kWide16 = kWide8.for_lanes16();
constexpr LaneTables<128> kNarrow8(make_twiddles<128>(kRounded));
constexpr LaneTables<256> kSuppression8(make_twiddles<256>(kTruncated));
constexpr LaneTables<256> kSuppression16 = kSuppression8.for_lanes16();

}  // namespace

constinit const TransformPlan kWideTransform = {256, orvalis_phs_tbl_WB.data(), factors_of(kWide8),
                                                factors_of(kWide16)};
constinit const TransformPlan kNarrowTransform = {
    128, orvalis_phs_tbl_NB.data(), factors_of(kNarrow8), {}};
constinit const TransformPlan kSuppressionTransform = {
    256, orvalis_phs_tbl_256.data(), factors_of(kSuppression8), factors_of(kSuppression16)};

}  // namespace orvalis
