// Twiddle factors and stage steps, made at compile time, and the plans that use them.
#include <array>

#include "Voice_Engine/basic_op/constexpr_math.h"
#include "Voice_Engine/basic_op/hidden_table.h"
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

constinit const TransformPlan kWideTransform = {256, 7, orvalis_phs_tbl_WB.data(),
                                                orvalis_ii_table_WB.data()};
constinit const TransformPlan kNarrowTransform = {128, 6, orvalis_phs_tbl_NB.data(),
                                                  orvalis_ii_table_NB.data()};
constinit const TransformPlan kSuppressionTransform = {256, 7, orvalis_phs_tbl_256.data(),
                                                       orvalis_ii_table_256.data()};

}  // namespace orvalis
