#include "Voice_Engine/basic_op/log_exp.h"

#include "Voice_Engine/basic_op/constexpr_math.h"

namespace {

constexpr Log2Table make_log2_table() {
  Log2Table table{};
  for (std::size_t i = 0; i < table.size(); ++i) {
    const double log2 = orvalis::constexpr_math::log2_of(1 + static_cast<double>(i) / 32);
    table[i] = orvalis::constexpr_math::rounded_word16(32768 * log2);
  }
  return table;
}

}  // namespace

constinit const Log2Table orvalis_tablog = make_log2_table();
ORVALIS_EXPORT_TABLE(Log2Table, tablog);
