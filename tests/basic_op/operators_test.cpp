// The plain and the ns_ copy against the definitions.
#include <gtest/gtest.h>

#include <cmath>
#include <cstdlib>

#include "basic_op.h"
#include "expect_operator.h"

namespace orvalis::test {
namespace {

#define EXPECT_BOTH(plain, ns)                                \
  do {                                                        \
    expect_operator(#plain, PLAIN, plain, definition::plain); \
    expect_operator(#plain, NS, ns, definition::plain);       \
  } while (false)
#define EXPECT_PLAIN(plain) expect_operator(#plain, PLAIN, plain, definition::plain)

TEST(Operators, SixteenBits) {
  EXPECT_BOTH(abs_s, ns_abs_s);
  EXPECT_BOTH(negate, ns_negate);
  EXPECT_BOTH(sature, ns_sature);
  EXPECT_BOTH(add, ns_add);
  EXPECT_BOTH(sub, ns_sub);
  EXPECT_BOTH(mult, ns_mult);
  EXPECT_BOTH(mult_r, ns_mult_r);
  EXPECT_BOTH(shl, ns_shl);
  EXPECT_BOTH(shr, ns_shr);
  EXPECT_BOTH(shr_r, ns_shr_r);
  EXPECT_BOTH(shift_r, ns_shift_r);
  EXPECT_BOTH(norm_s, ns_norm_s);
  EXPECT_BOTH(div_s, ns_div_s);
}

TEST(Operators, ThirtyTwoBits) {
  EXPECT_BOTH(extract_h, ns_extract_h);
  EXPECT_BOTH(extract_l, ns_extract_l);
  EXPECT_BOTH(L_deposit_h, ns_L_deposit_h);
  EXPECT_BOTH(L_deposit_l, ns_L_deposit_l);
  EXPECT_BOTH(L_abs, ns_L_abs);
  EXPECT_BOTH(L_negate, L_ns_negate);
  EXPECT_BOTH(L_add, L_ns_add);
  EXPECT_BOTH(L_sub, L_ns_sub);
  EXPECT_BOTH(L_mult, L_ns_mult);
  EXPECT_BOTH(L_mac, ns_L_mac);
  EXPECT_BOTH(L_msu, ns_L_msu);
  EXPECT_BOTH(round_BOP, ns_round);
  EXPECT_BOTH(mac_r, ns_mac_r);
  EXPECT_BOTH(msu_r, ns_msu_r);
  EXPECT_BOTH(L_shl, L_ns_shl);
  EXPECT_BOTH(L_shr, L_ns_shr);
  EXPECT_BOTH(L_shr_r, L_ns_shr_r);
  EXPECT_BOTH(norm_l, ns_norm_l);
}

TEST(Operators, Carry) {
  EXPECT_BOTH(L_add_c, L_ns_add_c);
  EXPECT_BOTH(L_sub_c, L_ns_sub_c);
  EXPECT_BOTH(L_macNs, ns_L_macNs);
  EXPECT_BOTH(L_msuNs, ns_L_msuNs);
  EXPECT_BOTH(L_sat, ns_L_sat);
}

TEST(Operators, LongAndComplexProducts) {
  EXPECT_BOTH(L_mpy_ll, ns_L_mpy_ll);
  EXPECT_BOTH(L_mpy_ls, ns_L_mpy_ls);
  EXPECT_BOTH(L_divide, ns_L_divide);
  EXPECT_BOTH(C2PREAL_SS, NS_C2PREAL_SS);
  EXPECT_BOTH(C2PIMAG_SS, NS_C2PIMAG_SS);
  EXPECT_BOTH(C2PREAL_LS, NS_C2PREAL_LS);
  EXPECT_BOTH(C2PIMAG_LS, NS_C2PIMAG_LS);
  EXPECT_BOTH(C3PREAL, NS_C3PREAL);
  EXPECT_BOTH(C3PIMAG, NS_C3PIMAG);
}

/// hi and lo in one word, as a pair that a test can return.
int32_t extracted(int32_t x) {
  int16_t hi, lo;
  L_Extract(x, &hi, &lo);
  return static_cast<int32_t>(static_cast<uint32_t>(hi) << 16 | static_cast<uint16_t>(lo));
}

TEST(Operators, DoublePrecision) {
  EXPECT_BOTH(L_Comp, ns_L_Comp);
  EXPECT_PLAIN(Mpy_32);
  EXPECT_PLAIN(Mpy_32_16);
  EXPECT_PLAIN(Div_32);
  expect_operator("L_Extract", PLAIN, extracted, [](definition::Flags &, definition::Wide x) {
    return (x >> 16) * 65536 + (x >> 1 & 0x7FFF);
  });
}

// The definitions above are built from steps; these check the steps by their meaning.
TEST(Operators, LongProductsAndQuotientsAreAccurate) {
  std::mt19937_64 random = seeded_generator();
  for (int i = 0; i < 100000; ++i) {
    const auto a = static_cast<int32_t>(random()), b = static_cast<int32_t>(random());
    const auto c = static_cast<int16_t>(random());
    ASSERT_NEAR(L_mpy_ll(a, b), std::ldexp(double{1} * a * b, -31), 4.0) << a << ' ' << b;
    ASSERT_NEAR(L_mpy_ls(a, c), std::ldexp(double{1} * a * c, -15), 2.0) << a << ' ' << c;
    const int32_t divisor = (a & 0x3FFFFFFF) | 0x40000000;
    const int32_t dividend = b & 0x3FFFFFFF;
    const double quotient = std::ldexp(double{1} * dividend / divisor, 31);
    ASSERT_NEAR(L_divide(dividend, divisor), quotient, 48.0) << dividend << " / " << divisor;
    int16_t hi, lo;
    L_Extract(divisor, &hi, &lo);
    ASSERT_NEAR(Div_32(dividend, hi, lo), quotient, 48.0) << dividend << " / " << divisor;
  }
}

}  // namespace
}  // namespace orvalis::test
