// The ZOLT_ copy: its silent saturation, its own flags, its fatal divisions.
#include <gtest/gtest.h>

#include "basic_op.h"
#include "expect_operator.h"
#include "tests/support/fatal.h"

namespace orvalis::test {
namespace {

using definition::Flags;
using definition::Wide;

#define EXPECT_ZOLT(name)            expect_operator("ZOLT_" #name, ZOLT, ZOLT_##name, definition::name)
#define EXPECT_ZOLT_AS(name, define) expect_operator(#name, ZOLT, name, define)

Wide product(Wide a, Wide b) { return definition::clip32(2 * a * b); }
Wide rounded(Wide x) { return definition::clip32(x + 0x8000) >> 16; }

TEST(ZoltOperators, LikeThePlainCopy) {
  EXPECT_ZOLT(abs_s);
  EXPECT_ZOLT(negate);
  EXPECT_ZOLT(extract_h);
  EXPECT_ZOLT(extract_l);
  EXPECT_ZOLT(L_negate);
  EXPECT_ZOLT(L_abs);
  EXPECT_ZOLT(L_deposit_h);
  EXPECT_ZOLT(L_deposit_l);
  EXPECT_ZOLT(norm_s);
  EXPECT_ZOLT(norm_l);
  EXPECT_ZOLT(L_sub);
  EXPECT_ZOLT(L_add_c);
  EXPECT_ZOLT(L_sub_c);
  EXPECT_ZOLT(L_sat);
  EXPECT_ZOLT_AS(ZOLT_short_sat, definition::sature);
}

TEST(ZoltOperators, SilentSaturation) {
  EXPECT_ZOLT_AS(ZOLT_add, [](Flags &, Wide a, Wide b) { return definition::clip16(a + b); });
  EXPECT_ZOLT_AS(ZOLT_sub, [](Flags &, Wide a, Wide b) { return definition::clip16(a - b); });
  EXPECT_ZOLT_AS(ZOLT_mult_r, [](Flags &, Wide a, Wide b) {
    return definition::clip16((a * b + 0x4000) >> 15);
  });
  EXPECT_ZOLT_AS(ZOLT_S_round, [](Flags &, Wide x) { return rounded(x); });
  EXPECT_ZOLT_AS(ZOLT_L_mac, [](Flags &, Wide s, Wide a, Wide b) {
    return definition::clip32(s + product(a, b));
  });
  EXPECT_ZOLT_AS(ZOLT_mac_r, [](Flags &, Wide s, Wide a, Wide b) {
    return rounded(definition::clip32(s + product(a, b)));
  });
  EXPECT_ZOLT_AS(ZOLT_L_mls, [](Flags &, Wide x, Wide v) {
    return definition::clip32(((x & 0xFFFF) * v >> 15) + product(v, x >> 16));
  });
  EXPECT_ZOLT_AS(ZOLT_i_mult, [](Flags &, Wide a, Wide b) { return a * b; });
  EXPECT_ZOLT_AS(ZOLT_expadj_s, [](Flags &f, Wide x, Wide max_shift) {
    return std::min(max_shift, x == 0 ? 15 : definition::norm_s(f, x));
  });
}

TEST(ZoltOperators, FlagsOfTheSumOnly) {
  EXPECT_ZOLT_AS(ZOLT_L_msu, [](Flags &f, Wide s, Wide a, Wide b) {
    return definition::L_sub(f, s, product(a, b));
  });
  EXPECT_ZOLT_AS(ZOLT_msu_r, [](Flags &f, Wide s, Wide a, Wide b) {
    return rounded(definition::L_sub(f, s, product(a, b)));
  });
  EXPECT_ZOLT_AS(ZOLT_L_macNs, [](Flags &f, Wide s, Wide a, Wide b) {
    return definition::L_add_c(f, s, product(a, b));
  });
  EXPECT_ZOLT_AS(ZOLT_L_msuNs, [](Flags &f, Wide s, Wide a, Wide b) {
    return definition::L_sub_c(f, s, product(a, b));
  });
}

TEST(ZoltOperators, ShiftWrapsUpToFifteen) {
  EXPECT_ZOLT_AS(ZOLT_shr, [](Flags &, Wide x, Wide n) {
    const Wide shifted = definition::scaled(x, -n);
    return n < -15 ? definition::clip16(shifted) : definition::low(shifted);
  });
  EXPECT_EQ(ZOLT_shr(0x4000, -2), 0);
  EXPECT_EQ(ZOLT_shr(1, -16), 32767);
}

// The exported divisions would end the process outside their range.
int16_t safe_div_s(int16_t a, int16_t b) { return a < 0 || a > b || b == 0 ? 0 : ZOLT_div_s(a, b); }
int16_t safe_div_l(int32_t a, int16_t b) { return a < 0 || b <= 0 ? 0 : ZOLT_div_l(a, b); }

TEST(ZoltDivision, InRange) {
  EXPECT_ZOLT_AS(safe_div_s, [](Flags &, Wide a, Wide b) -> Wide {
    return a <= 0 || a > b ? 0 : std::min(a * 32768 / b, definition::max16);
  });
  EXPECT_ZOLT_AS(safe_div_l, [](Flags &, Wide a, Wide b) -> Wide {
    return a < 0 || b <= 0 ? 0 : std::min((a >> 1) / b, definition::max16);
  });
}

TEST(ZoltDivisionDeathTest, OutOfRangePrintsAndEndsTheProcess) {
  EXPECT_FATAL(ZOLT_div_s(5, 3), 0, "Division Error\n");
  EXPECT_FATAL(ZOLT_div_s(-1, 3), 0, "Division Error\n");
  EXPECT_FATAL(ZOLT_div_s(0, -1), 0, "Division Error\n");
  EXPECT_FATAL(ZOLT_div_s(1, 0), 0, "Division Error\n");
  EXPECT_FATAL(ZOLT_div_s(0, 0), 0, "Division by 0, Fatal error \n");
  EXPECT_FATAL(ZOLT_div_l(1, 0), 0, "Division by 0 in div_l, Fatal error \n");
  EXPECT_FATAL(ZOLT_div_l(-1, 0), 0, "Division by 0 in div_l, Fatal error \n");
  EXPECT_FATAL(ZOLT_div_l(1, -1), 0, "Division Error in div_l, Fatal error \n");
  EXPECT_FATAL(ZOLT_div_l(-1, 1), 0, "Division Error in div_l, Fatal error \n");
}

}  // namespace
}  // namespace orvalis::test
