// The exponential integral and its polynomial.
#include <gtest/gtest.h>

#include <cmath>
#include <numbers>

#include "Math_baseop.h"
#include "tests/support/error_range.h"
#include "tests/support/random.h"

namespace orvalis::test {
namespace {

constexpr double q12 = 1 << 12, q32 = 4294967296.0;

/// E1(x) by its continued fraction from far down, or by its series.
double exponential_integral(double x) {
  if (x > 2) {
    double fraction = 0;
    for (int j = 200; j > 0; --j) fraction = j / (1 + j / (x + fraction));
    return std::exp(-x) / (x + fraction);
  }
  double sum = -std::numbers::egamma - std::log(x), power = x;
  for (int k = 2; k < 60; ++k) {
    sum += power / (k - 1);
    power *= -x / k;
  }
  return sum;
}

TEST(ExponentialIntegral, Accuracy) {
  ErrorRange series, fraction;
  for (int32_t m = 1; m < 25 * 4096; ++m) {
    const int64_t got = ZOLT_expintFix(m);
    // The selecting polynomial changes its sign at 3.0163.
    (m <= 12354 ? series : fraction)
        .take(static_cast<double>(got) / q32 - exponential_integral(m / q12));
    ASSERT_EQ(got, ZOLT_expintFix(-m)) << m;
  }
  EXPECT_ERRORS(series, -0.0008, 0.0013);
  EXPECT_ERRORS(fraction, -6e-9, 9e-6);
}

TEST(ExponentialIntegral, BeyondTheExponentialsRangeItIsZero) {
  for (int64_t m = 21 * 4096 + 1; m < INT32_MAX; m += 1 + m / 3000)
    ASSERT_EQ(ZOLT_expintFix(static_cast<int32_t>(m)), 0) << m;
  EXPECT_EQ(ZOLT_expintFix(0), ZOLT_expintFix(1));
  EXPECT_EQ(ZOLT_expintFix(INT32_MAX), 0);
  EXPECT_EQ(ZOLT_expintFix(INT32_MIN), 0);
}

TEST(ExponentialIntegral, Polynomial) {
  std::mt19937_64 random = seeded_generator();
  int64_t c[9];
  for (int i = 0; i < 20000; ++i) {
    for (int64_t &coefficient : c) coefficient = static_cast<int64_t>(random()) >> 30;
    const auto x = static_cast<int32_t>(static_cast<int>(random() % 16384) - 8192);
    double value = static_cast<double>(c[0]);
    for (int n = 1; n <= 9; ++n) {
      if (n > 1) value = value * x / q12 + static_cast<double>(c[n - 1]);
      // Each step rounds to a unit, which the next ones double at most.
      ASSERT_NEAR(static_cast<double>(ZOLT_POLYVALFix(c, x, n)), value, 256) << x << ", " << n;
    }
    ASSERT_EQ(ZOLT_POLYVALFix(c, x, 0), c[0]);
    ASSERT_EQ(ZOLT_POLYVALFix(c, x, 10), ZOLT_POLYVALFix(c, x, 9));
  }
  // The product saturates by the sign of its upper half before the lower half is added; the sum
  // with the coefficient wraps.
  const int64_t large[9] = {int64_t{1} << 62, 5, 0, 0, 0, 0, 0, 0, 0};
  EXPECT_EQ(ZOLT_POLYVALFix(large, 4 * 4096, 2), INT64_MIN + 4);
  EXPECT_EQ(ZOLT_POLYVALFix(large, -4 * 4096, 2), INT64_MIN + 5);
  const int64_t halves[9] = {2048, 0, -2048, 0, 0, 0, 0, 0, 0};
  EXPECT_EQ(ZOLT_POLYVALFix(halves, 1, 2), 1);  // 0.5 rounds up
  EXPECT_EQ(ZOLT_POLYVALFix(halves + 2, 1, 2), 0);
}

}  // namespace
}  // namespace orvalis::test
