// 64-bit helpers and windows. An exact integer result is known by its low 64 bits, which unsigned
// arithmetic gives, and by its size in double precision.
#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <vector>

#include "Math_baseop.h"
#include "tests/support/fatal.h"
#include "tests/support/random.h"

namespace orvalis::test {
namespace {

constexpr double range64 = 9223372036854775808.0;

uint64_t bits(int64_t x) { return static_cast<uint64_t>(x); }
uint64_t magnitude(int64_t x) { return x < 0 ? -bits(x) : bits(x); }
double real(int64_t x) { return static_cast<double>(x); }

/// Values of every size, both signs, and the corners.
std::vector<int64_t> operands(int count) {
  std::mt19937_64 random = seeded_generator();
  std::vector<int64_t> values{0, 1, -1, 1024, -1024, INT32_MAX, INT32_MIN, INT64_MAX, INT64_MIN};
  for (int i = 0; i < count; ++i)
    values.push_back(static_cast<int64_t>(random()) >> (random() % 64));
  return values;
}

/// Holds result to floor(numerator / 2^shift), the numerator known by its low bits and its size.
void expect_floor(int64_t result, uint64_t numerator_bits, double numerator, int shift) {
  ASSERT_LT(numerator_bits - (bits(result) << shift), uint64_t{1} << shift);
  ASSERT_NEAR(real(result), std::ldexp(numerator, -shift), 1 + std::abs(real(result)) * 1e-12);
}

TEST(Wide, QuotientInQ10) {
  const std::vector<int64_t> values = operands(1500);
  for (const int64_t a : values)
    for (const int64_t b : values) {
      if (b == 0) continue;
      const int64_t got = ZOLT_L64_div(a, b);
      const double truth = real(a) / real(b) * 1024;
      if (std::abs(truth) > range64 * 1.0001) {
        ASSERT_EQ(got, truth < 0 ? INT64_MIN : INT64_MAX) << a << " / " << b;
      } else if (std::abs(truth) < range64 * 0.9999) {
        // Toward zero: what remains is below the divisor and the sign is that of the quotient.
        ASSERT_LT((magnitude(a) << 10) - magnitude(got) * magnitude(b), magnitude(b)) << a << b;
        ASSERT_NEAR(real(got), truth, 1 + std::abs(truth) * 1e-12) << a << " / " << b;
        ASSERT_TRUE(got == 0 || (got < 0) == ((a < 0) != (b < 0))) << a << " / " << b;
      }
    }
  EXPECT_EQ(ZOLT_L64_div(int64_t{1} << 53, 1), INT64_MAX);
  EXPECT_EQ(ZOLT_L64_div((int64_t{1} << 53) - 1, 1), ((int64_t{1} << 53) - 1) * 1024);
  EXPECT_EQ(ZOLT_L64_div(INT64_MIN, 1024), INT64_MIN);
  EXPECT_EQ(ZOLT_L64_div(-1, 3), -341);
}

TEST(Wide, ProductInQ32) {
  const std::vector<int64_t> values = operands(1500);
  for (const int64_t a : values)
    for (const int64_t b : values) {
      const int64_t got = ZOLT_L64_mult(a, b);
      const double truth = std::clamp(real(a) * (real(b) / 0x1p32), -range64, range64);
      if ((a >> 32) * (b >> 32) < int64_t{1} << 31) {
        const double unread = std::abs(real(a) / 0x1p32) + std::abs(real(b) / 0x1p32) + 1;
        ASSERT_NEAR(real(got), truth, unread + std::abs(truth) * 1e-12) << a << " * " << b;
      } else if (a > 0) {
        ASSERT_EQ(got, INT64_MAX) << a << " * " << b;
      }
    }
  constexpr int64_t one = int64_t{1} << 32;
  EXPECT_EQ(ZOLT_L64_mult(3 * one / 2, -5 * one / 2), -15 * one / 4);
  EXPECT_EQ(ZOLT_L64_mult(3, one), 2);  // bit 0 does not count
  EXPECT_EQ(ZOLT_L64_mult(32768 * one, 65536 * one), INT64_MAX);
  EXPECT_EQ(ZOLT_L64_mult(32768 * one, -65536 * one), INT64_MIN);
  EXPECT_EQ(ZOLT_L64_mult(32768 * one, -65537 * one), INT64_MIN);
  // Upper halves -46341 and -46341 leave the range: their product counts as its end, and the lower
  // halves, twice a half, still take 2 * 46341 * 0.5 from it, each way.
  const int64_t x = -46341 * one + one / 2;
  EXPECT_EQ(ZOLT_L64_mult(x, x), INT64_MAX - 46341 * one + one / 4);
}

TEST(Wide, ProductWith32Bits) {
  const std::vector<int64_t> values = operands(800);
  for (const int64_t a : values)
    for (const int64_t b : values) {
      const auto factor = static_cast<int32_t>(b);
      expect_floor(ZOLT_LL_mult_64a32(a, factor), bits(a) * bits(factor), real(a) * factor, 32);
    }
}

TEST(Wide, Root) {
  for (const int64_t operand : operands(200000)) {
    if (operand < 0) continue;
    const int64_t root = ZOLT_L64_sqrt_Q0(operand);
    // Rounding up begins at r * r + r.
    ASSERT_GE(operand, root * (root - 1));
    if (root < INT32_MAX) {
      ASSERT_LT(operand, std::max<int64_t>(root * (root + 1), 1));
    }
  }
  const int64_t largest = INT32_MAX;
  EXPECT_EQ(ZOLT_L64_sqrt_Q0(0), 1);
  EXPECT_EQ(ZOLT_L64_sqrt_Q0(1), 1);
  EXPECT_EQ(ZOLT_L64_sqrt_Q0(2), 2);
  EXPECT_EQ(ZOLT_L64_sqrt_Q0(10 * 10 + 9), 10);
  EXPECT_EQ(ZOLT_L64_sqrt_Q0(10 * 10 + 10), 11);
  EXPECT_EQ(ZOLT_L64_sqrt_Q0(largest * largest), INT32_MAX);
  EXPECT_EQ(ZOLT_L64_sqrt_Q0(INT64_MAX), INT32_MAX);
}

TEST(Wide, GreatestCommonDivisor) {
  for (int32_t a = -60; a <= 60; ++a)
    for (int32_t b = -60; b <= 60; ++b) {
      int32_t divisor = 0;
      for (int32_t d = 1; d <= 60; ++d)
        if (a % d == 0 && b % d == 0) divisor = d;
      EXPECT_EQ(ZOLT_get_gcd(a, b), a == 0 && b == 0 ? 0 : divisor) << a << ", " << b;
    }
  EXPECT_EQ(ZOLT_get_gcd(INT32_MIN, 3 << 20), 1 << 20);
  EXPECT_EQ(ZOLT_get_gcd(INT32_MIN, INT32_MIN), INT32_MAX);
  EXPECT_EQ(ZOLT_get_gcd(0, INT32_MIN), INT32_MAX);
}

TEST(WideDeathTest, RootOfNegative) {
  EXPECT_FATAL(ZOLT_L64_sqrt_Q0(-1), 255,
               "<Voice_Engine/MCRAvad/Math_baseop::1910s> sqrt error with negative input\n");
}

TEST(WideDeathTest, DivisionByZero) {
  EXPECT_FATAL(ZOLT_L64_div(1, 0), 255,
               "<Voice_Engine/MCRAvad/Math_baseop::1954>--Error with Division by 0\n");
}

TEST(Wide, AbsoluteValue) {
  for (const int64_t x : operands(1000))
    EXPECT_EQ(ZOLT_L64_abs(x), x == INT64_MIN ? INT64_MAX : std::abs(x));
  EXPECT_EQ(ZOLT_abs_double(-2.5), 2.5);
  EXPECT_FALSE(std::signbit(ZOLT_abs_double(-0.0)));
}

TEST(Windows, Products) {
  const std::vector<int64_t> values = operands(600);
  for (const int64_t a : values)
    for (const int64_t b : values) {
      const auto w = static_cast<int32_t>(b);
      int64_t x64 = a;
      ZOLT_L64_addHamFix(1, &x64, &w);
      if (w != INT32_MIN || a >= INT64_MIN + 0x100000000)
        expect_floor(x64, bits(a) * bits(w) + 0x40000000, real(a) * w, 31);
      auto x32 = static_cast<int32_t>(a);
      const int64_t whole = int64_t{x32} * w;
      ZOLT_I_addHamFix(1, &x32, &w);
      ASSERT_EQ(x32, std::min<int64_t>(whole >> 31, INT32_MAX));
      auto x16 = static_cast<int16_t>(a);
      const auto w16 = static_cast<int16_t>(b);
      const int rounded = (x16 * w16 + 16384) >> 15;
      ZOLT_S_addHamFix(1, &x16, &w16);
      ASSERT_EQ(x16, std::min(rounded, INT16_MAX));
    }
  // -1 * -1, the only products out of range. The lower half counts after the clamp.
  int64_t least[] = {INT64_MIN, INT64_MIN + 7};
  const int32_t minus_one[] = {INT32_MIN, INT32_MIN};
  ZOLT_L64_addHamFix(2, least, minus_one);
  EXPECT_EQ(least[0], INT64_MAX);
  EXPECT_EQ(least[1], INT64_MAX - 7);
}

TEST(Windows, WeighJustTheirValues) {
  int16_t x[] = {100, 200, 300};
  const int16_t w[] = {16384, -32768, 0};
  ZOLT_S_addHamFix(-1, x, w);
  ZOLT_S_addHamFix(0, x, w);
  EXPECT_EQ(x[0], 100);
  ZOLT_S_addHamFix(2, x, w);
  EXPECT_EQ(x[0], 50);
  EXPECT_EQ(x[1], -200);
  EXPECT_EQ(x[2], 300);
}

/// Order-dependent sum: a digit that is wrong or out of place changes it.
template <class Table>
uint64_t checksum(const Table &table) {
  uint64_t sum = 0;
  for (const auto entry : table) sum = sum * 31 + bits(entry);
  return sum;
}

TEST(Windows, Tables) {
  const auto hann = [](int n, double period, double scale) {
    return scale * (0.5 - 0.5 * std::cos(2 * M_PI * n / period));
  };
  for (int n = 0; n < 160; ++n) EXPECT_NEAR(ZOLT_vadHamTable1[n], hann(n, 159.5, 32768), 1) << n;
  for (int n = 0; n < 9; ++n) EXPECT_NEAR(ZOLT_vadHamTable2[n], hann(n, 8, 0x1p31), 1) << n;
  for (int n = 0; n < 41; ++n) EXPECT_NEAR(ZOLT_vadHamTable3[n], hann(n, 40, 0x1p31), 1506) << n;
  EXPECT_EQ(ZOLT_vadHamTable1[80], 32767);
  EXPECT_EQ(checksum(ZOLT_vadHamTable1), 0xFAD972499F8EF9Fu);
  EXPECT_EQ(checksum(ZOLT_vadHamTable3), 0x700D0F1DCEEF6B0Fu);
}

}  // namespace
}  // namespace orvalis::test
