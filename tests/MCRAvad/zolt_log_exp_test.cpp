// Logarithm, exponential and powers of the extended mathematics: bits by their definition, and how
// far they are from the truth.
#include <gtest/gtest.h>

#include <cmath>

#include "Math_baseop.h"
#include "tests/support/error_range.h"
#include "tests/support/fatal.h"
#include "tests/support/flag_words.h"
#include "tests/support/random.h"

namespace orvalis::test {
namespace {

constexpr double q11 = 1 << 11, q15 = 1 << 15, q26 = 1 << 26, q31 = 2147483648.0, q32 = 2 * q31;

/// Every size of a 32-bit value, in steps that grow with it.
template <class Check>
void for_sizes(int64_t first, int64_t last, int64_t steps_per_size, Check check) {
  for (int64_t x = first; x <= last; x += 1 + x / steps_per_size) check(x);
  check(last);
}

TEST(ZoltLogExp, Tables) {
  for (int i = 0; i < 128; ++i) {
    EXPECT_EQ(ZOLT_LPow2PlusFr1[i], std::llround(0x1p30L * std::exp2(i / 128.0L))) << i;
    EXPECT_EQ(LPow2PlusFr1[i], ZOLT_LPow2PlusFr1[i]) << i;
  }
  for (int i = 0; i < 64; ++i) {
    const long double lagging = std::max(i - 1, 0) / 8192.0L;
    EXPECT_EQ(ZOLT_LPow2PlusFr2[i], std::llround(0x1p30L * std::exp2(lagging))) << i;
    EXPECT_EQ(LPow2PlusFr2[i], ZOLT_LPow2PlusFr2[i]) << i;
  }
  for (int k = 0; k < 19; ++k) {
    const long double exponent = std::exp2(k - 15.0L);
    EXPECT_EQ(exp_coef_plus[k], std::llround(0x1p18L * std::exp(exponent))) << k;
    EXPECT_EQ(exp_coef_minus[k], std::llround(0x1p18L * std::exp(-exponent))) << k;
  }
}

/// Exponent and polynomial of ln(x) in Q27, the polynomial before its last shift in Q31.
std::pair<int, int64_t> logarithm_by_definition(uint32_t x) {
  int norm = -1;  // from 2^31 on; below, what brings x to 2^30..2^31 - 1
  while (norm < 30 && (static_cast<uint64_t>(x) << (norm + 1)) < 0x80000000) ++norm;
  const int64_t mantissa = norm < 0 ? x >> 1 : static_cast<int64_t>(x) << norm;
  const int64_t f = mantissa / 32768 - 32768;
  int64_t sum = 0, power = f;
  for (const int c : {32749, -16106, 9456, -4426, 1040}) {
    sum += 2 * c * power;
    power = power * f / 32768;
  }
  return {14 - norm, sum};
}

TEST(ZoltLogExp, LogarithmAsDefinedAndItsAccuracy) {
  ErrorRange l_error, s_error;
  for_sizes(1, UINT32_MAX, 40000, [&](int64_t wide) {
    const auto x = static_cast<uint32_t>(wide);
    const auto [exponent, sum] = logarithm_by_definition(x);
    ASSERT_EQ(ZOLT_L_log(x), exponent * 46518272 + (sum >> 5)) << x;
    ASSERT_EQ(ZOLT_S_log(x), (exponent * int64_t{93036544} + (sum >> 4)) >> 16) << x;
    l_error.take(ZOLT_L_log(x) / q26 - std::log(x / 65536.0));
    s_error.take(ZOLT_S_log(x) / q11 - std::log(x / 65536.0));
  });
  EXPECT_ERRORS(l_error, -0.00047, 0.00047);
  EXPECT_ERRORS(s_error, -0.00094, 0.00047);
  EXPECT_EQ(ZOLT_L_log(0), INT32_MIN);
  EXPECT_EQ(ZOLT_S_log(0), INT16_MIN);
  EXPECT_EQ(ZOLT_L_log(65536), 0);
}

/// e^x by the table's own product, for arguments that are not cut off.
int64_t exponential_by_definition(int64_t x) {
  const int64_t y = (x * 1549082005 + (1 << 29)) >> 30;
  const int64_t whole = y >> 26, fraction = y & ((1 << 26) - 1);
  const int64_t coarse = fraction >> 19, rest = fraction & ((1 << 19) - 1);
  const int64_t fine = std::min<int64_t>((rest + (1 << 12)) >> 13, 63);
  const int64_t product = static_cast<int64_t>(ZOLT_LPow2PlusFr1[coarse]) * ZOLT_LPow2PlusFr2[fine];
  const int64_t v = (product + (1 << 29)) >> 30;
  return whole < 0 ? v * 4 >> -whole : v * 4 << whole;
}

TEST(ZoltLogExp, ExponentialAsDefinedAndItsAccuracy) {
  ErrorRange relative, units;
  for (int64_t wide = -1409286143; wide <= 1409286143; wide += 9973) {
    const auto x = static_cast<int32_t>(wide);
    const int64_t power = ZOLT_L_exp(x);
    const double truth = std::exp(x / q26) * q32;
    ASSERT_EQ(power, exponential_by_definition(x)) << x;
    ASSERT_EQ(power, x < 0 ? L_exp_mius(x) : L_exp_plus(x)) << x;
    if (x > -(1 << 26)) relative.take(static_cast<double>(power) / truth - 1);
    units.take(std::min(static_cast<double>(power) - truth * (1 - 0.00017), 0.0));
  }
  EXPECT_ERRORS(relative, -0.00017, 0);
  EXPECT_GE(units.least, -1);
  EXPECT_EQ(ZOLT_L_exp(0), int64_t{1} << 32);
  for (const int32_t above : {0x53FFFFFF + 1, INT32_MAX}) {
    EXPECT_EQ(ZOLT_L_exp(above), 0x4E9B87F67BB3F559);
    EXPECT_EQ(L_exp_plus(above), 0x4E9B87F67BB3F559);
    EXPECT_EQ(ZOLT_L_exp(-above), 0);
    EXPECT_EQ(L_exp_mius(-above), 0);
  }
  EXPECT_GT(ZOLT_L_exp(-0x53FFFFFF), 0);
  EXPECT_EQ(ZOLT_L_exp(INT32_MIN), 0);
}

TEST(ZoltLogExp, ExponentialUndoesLogarithm) {
  for_sizes(1, UINT32_MAX, 100, [&](int64_t x) {
    const double again = static_cast<double>(ZOLT_L_exp(ZOLT_L_log(static_cast<uint32_t>(x))));
    EXPECT_NEAR(again / (65536.0 * static_cast<double>(x)), 1, 0.0007) << x;
  });
}

TEST(ZoltLogExp, PowerOfTwo) {
  std::mt19937_64 random = seeded_generator();
  ErrorRange one, two;
  for (int32_t x = 0; x < 1 << 20; x += 3) {
    const double truth = std::exp2(x / 1048576.0 + 30);
    one.take(ZOLT_L_pow2_plus(x, 20, 30, 0) / truth - 1);
    two.take(ZOLT_L_pow2_plus(x, 20, 30, 1) / truth - 1);
  }
  EXPECT_ERRORS(one, -0.0055, 0.0028);
  EXPECT_ERRORS(two, -0.00017, 4e-10);  // upward no more than the rounding of a table entry

  // Any format: what the finest one gives, shifted and rounded.
  for (int i = 0; i < 400000; ++i) {
    const auto q = static_cast<int16_t>(static_cast<int>(random() % 60) - 10);
    const auto x = static_cast<int32_t>((random() >> 33) >> (random() % 31));
    const double exponent = std::ldexp(x, -q);
    if (exponent >= 32768) continue;
    const auto out_q = static_cast<int16_t>(30 - std::floor(exponent) - random() % 40 + 3);
    const double truth = std::exp2(exponent + out_q);
    for (const uint16_t mode : {0, 1, 65535}) {
      const double got = ZOLT_L_pow2_plus(x, q, out_q, mode);
      if (std::floor(exponent) + out_q > 30) {
        ASSERT_EQ(got, INT32_MAX) << x << " Q" << q << " to Q" << out_q;
      } else {
        ASSERT_NEAR(got, truth, 0.5001 + truth * (mode == 0 ? 0.0055 : 0.00017))
            << x << " Q" << q << " to Q" << out_q;
      }
    }
  }
  // Halves round up, quarters down; formats beyond all bits.
  EXPECT_EQ(ZOLT_L_pow2_plus(0, 10, -1, 1), 1);
  EXPECT_EQ(ZOLT_L_pow2_plus(0, 10, -2, 1), 0);
  EXPECT_EQ(ZOLT_L_pow2_plus(0, INT16_MIN, INT16_MIN, 0), 0);
  EXPECT_EQ(ZOLT_L_pow2_plus(0, INT16_MIN, INT16_MAX, 0), INT32_MAX);
  EXPECT_EQ(ZOLT_L_pow2_plus(INT32_MAX, INT16_MAX, 30, 1), 1 << 30);
  EXPECT_EQ(ZOLT_L_pow2_plus(32767, 0, 30 - 32767, 1), 1 << 30);
}

TEST(ZoltLogExpDeathTest, PowerOfTwoOutOfRange) {
  constexpr char line[] =
      "Voice_Engine/MCRAvad/Math_baseop:2027 :: pow2 Overflow_ZOLT of too small Qx\n";
  EXPECT_FATAL(ZOLT_L_pow2_plus(-1, 26, 30, 1), 255, line);
  EXPECT_FATAL(ZOLT_L_pow2_plus(32768, 0, 30, 0), 255, line);
  EXPECT_FATAL(ZOLT_L_pow2_plus(1, INT16_MIN, 30, 1), 255, line);
}

TEST(ZoltLogExp, GeneralPower) {
  std::mt19937_64 random = seeded_generator();
  ErrorRange relative;
  for (int i = 0; i < 400000; ++i) {
    const auto x = static_cast<int32_t>((random() >> 34) >> (random() % 30));  // up to 2^30
    const auto y = static_cast<int32_t>(random());
    const double truth = std::pow(x / q15, y / q31);
    if (x == 0 || truth > 65535) continue;
    const double got = ZOLT_L_pow(x, y) / q15;
    ASSERT_NEAR(got, truth, truth * 0.00065 + 1 / q15) << x << " ^ " << y;
    if (truth > 1) relative.take(got / truth - 1);
  }
  EXPECT_ERRORS(relative, -0.00021, 0.00045);
  EXPECT_EQ(ZOLT_L_pow(1 << 15, INT32_MAX), 1 << 15);
  EXPECT_EQ(ZOLT_L_pow(INT32_MAX, INT32_MAX), ZOLT_L_pow(1 << 30, INT32_MAX));
  EXPECT_EQ(ZOLT_L_pow(0, INT32_MAX), 0);
  EXPECT_EQ(ZOLT_L_pow(0, INT32_MIN), INT32_MAX);
}

TEST(ZoltLogExp, FlagsStay) {
  for (int standing = 0; standing < 4; ++standing) {
    const FlagWords flags = flags_of(ZOLT, standing & 1, standing >> 1);
    write_flags(flags);
    ZOLT_L_log(0);
    ZOLT_L_log(UINT32_MAX);
    ZOLT_S_log(1);
    ZOLT_L_pow(INT32_MIN, INT32_MIN);
    ZOLT_L_pow2_plus(5, 0, 30, 0);
    ZOLT_expintFix(INT32_MIN);
    ZOLT_expintFix(1);
    EXPECT_EQ(read_flags(), flags);
  }
}

}  // namespace
}  // namespace orvalis::test
