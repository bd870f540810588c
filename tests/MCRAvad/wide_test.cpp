// 64-bit helpers and windows. Exact results are known by their low 64 bits, from unsigned
// arithmetic, and by their size in double precision.
#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <vector>

#include "Math_baseop.h"
#include "tests/support/random.h"

namespace orvalis::test {
namespace {

constexpr double range64 = 0x1p63;
constexpr int64_t one_q32 = int64_t{1} << 32;

uint64_t bits(int64_t x) { return static_cast<uint64_t>(x); }
uint64_t magnitude(int64_t x) { return x < 0 ? -bits(x) : bits(x); }
double real(int64_t x) { return static_cast<double>(x); }

/// Calls check(a, b) for values of every size, both signs, and the corners.
template <class Check>
void for_operands(Check check) {
  std::mt19937_64 random = seeded_generator();
  std::vector<int64_t> values{0, 1, -1, INT32_MAX, INT32_MIN, INT64_MAX, INT64_MIN};
  for (int i = 0; i < 1000; ++i)
    values.push_back(static_cast<int64_t>(random()) >> (random() % 64));
  for (const int64_t a : values)
    for (const int64_t b : values) {
      check(a, b);
      if (testing::Test::HasFatalFailure()) FAIL() << "for " << a << " and " << b;
    }
}

/// Holds result to floor(numerator / 2^shift), the numerator known by its low bits and its size.
void expect_floor(int64_t result, uint64_t numerator_bits, double numerator, int shift) {
  ASSERT_LT(numerator_bits - (bits(result) << shift), uint64_t{1} << shift);
  ASSERT_NEAR(real(result), std::ldexp(numerator, -shift), 1 + std::abs(real(result)) * 1e-12);
}

TEST(Wide, QuotientInQ10) {
  for_operands([](int64_t a, int64_t b) {
    if (b == 0) return;
    const int64_t got = ZOLT_L64_div(a, b);
    const double truth = std::clamp(real(a) / real(b) * 1024, -range64, range64);
    ASSERT_NEAR(real(got), truth, 1 + std::abs(truth) * 1e-12);
    if (std::abs(truth) > range64 * 0.9999) return;
    // Toward zero: what remains is below the divisor.
    ASSERT_LT((magnitude(a) << 10) - magnitude(got) * magnitude(b), magnitude(b));
  });
  EXPECT_EQ(ZOLT_L64_div(int64_t{1} << 53, 1), INT64_MAX);
  EXPECT_EQ(ZOLT_L64_div((int64_t{1} << 53) - 1, 1), ((int64_t{1} << 53) - 1) * 1024);
  EXPECT_EQ(ZOLT_L64_div(-(int64_t{1} << 53) - 1, 1), INT64_MIN);
  EXPECT_EQ(ZOLT_L64_div(-1, 3), -341);
}

TEST(Wide, Products) {
  for_operands([](int64_t a, int64_t b) {
    const auto factor = static_cast<int32_t>(b);
    expect_floor(ZOLT_LL_mult_64a32(a, factor), bits(a) * bits(factor), real(a) * factor, 32);

    const int64_t upper = (a >> 32) * (b >> 32);
    const double truth = std::clamp(real(a) * (real(b) / 0x1p32), -range64, range64);
    const double unread = std::abs(real(a) / 0x1p32) + std::abs(real(b) / 0x1p32) + 1;
    if (upper < int64_t{1} << 31) {
      ASSERT_NEAR(real(ZOLT_L64_mult(a, b)), truth, unread + std::abs(truth) * 1e-12);
    } else if (a > 0) {
      ASSERT_EQ(ZOLT_L64_mult(a, b), INT64_MAX);
    }
  });
  EXPECT_EQ(ZOLT_L64_mult(3 * one_q32 / 2, -5 * one_q32 / 2), -15 * one_q32 / 4);
  EXPECT_EQ(ZOLT_L64_mult(3, one_q32), 2);  // bit 0 does not count
  EXPECT_EQ(ZOLT_L64_mult(32768 * one_q32, -65537 * one_q32), INT64_MIN);
  EXPECT_EQ(ZOLT_L64_mult(32768 * one_q32, -65536 * one_q32 + 2), INT64_MIN + 65536);
  // Upper halves -46341 and -46341 leave the range: their product counts as its end, and the lower
  // halves, each a half, still take 46341 from it.
  const int64_t x = -46341 * one_q32 + one_q32 / 2;
  EXPECT_EQ(ZOLT_L64_mult(x, x), INT64_MAX - 46341 * one_q32 + one_q32 / 4);
}

TEST(Wide, RootAndAbsoluteValue) {
  for_operands([](int64_t x, int64_t) {
    ASSERT_EQ(ZOLT_L64_abs(x), x == INT64_MIN ? INT64_MAX : std::abs(x));
    if (x < 0) return;
    const int64_t root = ZOLT_L64_sqrt_Q0(x);  // rounding up begins at r * r + r
    ASSERT_GE(x, root * (root - 1));
    ASSERT_TRUE(root == INT32_MAX || x < std::max<int64_t>(root * (root + 1), 1));
  });
  const int expected[] = {1, 1, 2, 2, 2, 2, 3};
  for (int x = 0; x < 7; ++x) EXPECT_EQ(ZOLT_L64_sqrt_Q0(x), expected[x]) << x;
  EXPECT_EQ(ZOLT_L64_sqrt_Q0(int64_t{1000000} * 999999), 1000000);
  EXPECT_EQ(ZOLT_L64_sqrt_Q0(int64_t{1000000} * 999999 - 1), 999999);
  EXPECT_EQ(ZOLT_L64_sqrt_Q0(INT64_MAX), INT32_MAX);
  EXPECT_FALSE(std::signbit(ZOLT_abs_double(-0.0)));
  EXPECT_EQ(ZOLT_abs_double(-2.5), 2.5);
}

TEST(Wide, GreatestCommonDivisor) {
  for (int32_t a = -30; a <= 30; ++a)
    for (int32_t b = -30; b <= 30; ++b) {
      int32_t divisor = a == 0 && b == 0 ? 0 : 30;
      while (divisor > 0 && (a % divisor != 0 || b % divisor != 0)) --divisor;
      EXPECT_EQ(ZOLT_get_gcd(a, b), divisor) << a << ", " << b;
    }
  EXPECT_EQ(ZOLT_get_gcd(INT32_MIN, 3 << 20), 1 << 20);
  EXPECT_EQ(ZOLT_get_gcd(0, INT32_MIN), INT32_MAX);
}

TEST(Windows, Products) {
  for_operands([](int64_t a, int64_t b) {
    // A second value stands behind the window.
    int64_t x64[] = {a, 5};
    int32_t x32[] = {static_cast<int32_t>(a), 5};
    int16_t x16[] = {static_cast<int16_t>(a), 5};
    const auto w32 = static_cast<int32_t>(b);
    const auto w16 = static_cast<int16_t>(b);
    const int64_t product = int64_t{x32[0]} * w32;
    const int rounded = (x16[0] * w16 + 16384) >> 15;
    ZOLT_L64_addHamFix(1, x64, &w32);
    ZOLT_I_addHamFix(1, x32, &w32);
    ZOLT_S_addHamFix(1, x16, &w16);
    if (w32 != INT32_MIN || a >= INT64_MIN + one_q32)
      expect_floor(x64[0], bits(a) * bits(w32) + 0x40000000, real(a) * w32, 31);
    ASSERT_EQ(x32[0], std::min<int64_t>(product >> 31, INT32_MAX));
    ASSERT_EQ(x16[0], std::min(rounded, INT16_MAX));
    ASSERT_TRUE(x64[1] == 5 && x32[1] == 5 && x16[1] == 5);
  });
  // -1 * -1, the only product out of range. The lower half counts after the clamp.
  int64_t least[] = {INT64_MIN, INT64_MIN + 7};
  const int32_t minus_one[] = {INT32_MIN, INT32_MIN};
  ZOLT_L64_addHamFix(-1, least, minus_one);
  EXPECT_EQ(least[0], INT64_MIN);
  ZOLT_L64_addHamFix(2, least, minus_one);
  EXPECT_EQ(least[0], INT64_MAX);
  EXPECT_EQ(least[1], INT64_MAX - 7);
}

}  // namespace
}  // namespace orvalis::test
