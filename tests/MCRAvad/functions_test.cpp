// The functions of the extended mathematics: errors over their whole range, and fixed points.
#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <numbers>

#include "Math_baseop.h"
#include "tests/support/flag_words.h"
#include "tests/support/random.h"

namespace orvalis::test {
namespace {

constexpr double q11 = 1 << 11, q15 = 1 << 15, q22 = 1 << 22, q26 = 1 << 26, q31 = 0x1p31;
constexpr double q32 = 0x1p32, pi = std::numbers::pi;

struct ErrorRange {
  double least = 0, most = 0;

  void take(double error) {
    least = std::min(least, error);
    most = std::max(most, error);
  }
  /// Checks both bounds, and that the sweep came near them: a bound that is much too wide proves
  /// nothing.
  void expect(const char *name, double lower, double upper) const {
    EXPECT_TRUE(lower <= least && least <= 0.75 * lower && 0.75 * upper <= most && most <= upper)
        << name << ": " << least << " to " << most << ", not " << lower << " to " << upper;
  }
};

/// E1(x) by its series or, further out, its continued fraction from far down.
double exponential_integral(double x) {
  double fraction = 0, sum = -std::numbers::egamma - std::log(x), power = x;
  for (int j = 200; j > 0; --j) fraction = j / (1 + j / (x + fraction));
  for (int k = 2; k < 60; ++k) {
    sum += power / (k - 1);
    power *= -x / k;
  }
  return x > 2 ? std::exp(-x) / (x + fraction) : sum;
}

/// Arguments in steps that begin with 1 and grow with the argument up to `step`.
struct Sweep {
  const char *name;
  int64_t first, last, step;
  double lower, upper;
  double (*error)(int64_t x);
};

#define ERROR(expression) [](int64_t x) -> double { return expression; }

// clang-format off
const Sweep sweeps[] = {
    {"log, Q26", 1, UINT32_MAX, 99999, -0.00047, 0.00047, ERROR(ZOLT_L_log(x) / q26 - std::log(x / 65536.0))},
    {"log, Q11", 1, UINT32_MAX, 99999, -0.00094, 0.00047, ERROR(ZOLT_S_log(x) / q11 - std::log(x / 65536.0))},
    {"exp, relative", -1 << 26, 0x53FFFFFF, 9973, -0.00017, 0, ERROR(ZOLT_L_exp(x) / q32 / std::exp(x / q26) - 1)},
    {"exp, units below that", -0x53FFFFFF, 0, 9973, -1, 0, ERROR(std::min(ZOLT_L_exp(x) - std::exp(x / q26) * q32 * (1 - 0.00017), 0.0))},
    {"pow2, one entry", 0, 1 << 20, 3, -0.0055, 0.0028, ERROR(ZOLT_L_pow2_plus(x, 20, 29, 0) / std::exp2(x / 0x1p20 + 29) - 1)},
    {"pow2, two entries", 0, 1 << 20, 3, -0.00017, 1e-9, ERROR(ZOLT_L_pow2_plus(x, 20, 29, 1) / std::exp2(x / 0x1p20 + 29) - 1)},
    {"expint by series", 1, 12354, 1, -0.0008, 0.0013, ERROR(ZOLT_expintFix(x) / q32 - exponential_integral(x / 4096.0))},
    {"expint by fraction", 12355, 100000, 1, -6e-9, 9e-6, ERROR(ZOLT_expintFix(x) / q32 - exponential_integral(x / 4096.0))},
    {"sin", INT32_MIN, INT32_MAX, 4001, -0.004, 0.004, ERROR(ZOLT_L_sin(x) / q31 - std::sin(x / q22))},
    {"cos", INT32_MIN, INT32_MAX, 4001, -0.004, 0.004, ERROR(ZOLT_L_cos(x) / q31 - std::cos(x / q22))},
    {"atan", 0, INT32_MAX, 99999, -0.00175, 0.00024, ERROR(ZOLT_L_atan(x) / q22 - std::atan(x / q11))},
    {"cuberoot, units", 1, INT32_MAX, 9973, -63, 63, ERROR(ZOLT_L_cuberoot(x) - std::cbrt(x / q31) * q31)},
    {"root15, units", 1, INT32_MAX, 9973, -4, 4, ERROR(ZOLT_L_root15(x) - std::pow(x / q31, 2.0 / 3) * q31)}};
// clang-format on

TEST(Functions, AccuracyOverTheirWholeRange) {
  for (const Sweep &sweep : sweeps) {
    ErrorRange range;
    for (int64_t x = sweep.first; x < sweep.last; x += std::min(1 + std::abs(x) / 1000, sweep.step))
      range.take(sweep.error(x));
    range.take(sweep.error(sweep.last));
    range.expect(sweep.name, sweep.lower, sweep.upper);
  }
}

TEST(Functions, AccuracyOfTwoArguments) {
  std::mt19937_64 random = seeded_generator();
  ErrorRange angle;
  for (int i = 0; i < 400000; ++i) {
    const int32_t x = static_cast<int32_t>(random()) >> random() % 31;
    const int32_t y = static_cast<int32_t>(random()) >> random() % 31;
    if (y != 0) angle.take(ZOLT_L_atan2(y, x) / q22 - std::atan2(y, x));
    const double truth = std::pow(x / q15, y / q31);
    if (x > 0 && x < 1 << 30 && truth < 65535) {
      const double got = ZOLT_L_pow(x, y) / q15;
      ASSERT_NEAR(got, truth, truth * 0.00065 + 1 / q15) << x << " ^ " << y;
    }
    // A power of two in any format: what the finest gives, shifted and rounded.
    const auto q = static_cast<int16_t>(static_cast<int>(random() % 60) - 10);
    const double exponent = std::ldexp(std::max(x, 0), -q);
    if (exponent >= 32768) continue;
    const int whole = static_cast<int>(exponent);
    const auto out_q = static_cast<int16_t>(33 - whole - static_cast<int>(random() % 40));
    for (const uint16_t mode : {0, 1, 65535}) {
      const double expected = whole + out_q > 30 ? INT32_MAX : std::exp2(exponent + out_q);
      const double tolerance = whole + out_q > 30 ? 0 : mode == 0 ? 0.0055 : 0.00017;
      ASSERT_NEAR(ZOLT_L_pow2_plus(std::max(x, 0), q, out_q, mode), expected,
                  0.5001 + expected * tolerance)
          << x << " in Q" << q << " to Q" << out_q;
    }
  }
  angle.expect("atan2", -0.00186, 0.00186);
}

TEST(Functions, FixedPointsOfLogarithmAndPowers) {
  EXPECT_EQ(ZOLT_L_log(0), INT32_MIN);
  EXPECT_EQ(ZOLT_S_log(0), INT16_MIN);
  EXPECT_EQ(ZOLT_L_log(65536), 0);
  EXPECT_EQ(ZOLT_L_exp(0), int64_t{1} << 32);
  EXPECT_GT(ZOLT_L_exp(-0x53FFFFFF), 0);
  EXPECT_EQ(ZOLT_L_exp(INT32_MIN), 0);
  for (const int32_t above : {0x53FFFFFF + 1, INT32_MAX}) {
    EXPECT_EQ(ZOLT_L_exp(above), 0x4E9B87F67BB3F559);
    EXPECT_EQ(ZOLT_L_exp(-above), 0);
  }
  EXPECT_EQ(ZOLT_L_pow2_plus(0, 10, -1, 1), 1);  // a half rounds up
  EXPECT_EQ(ZOLT_L_pow2_plus(0, 10, -2, 1), 0);
  EXPECT_EQ(ZOLT_L_pow2_plus(INT32_MAX, INT16_MAX, 30, 1), 1 << 30);
  EXPECT_EQ(ZOLT_L_pow2_plus(32767, 0, 30 - 32767, 1), 1 << 30);
  EXPECT_EQ(ZOLT_L_pow(INT32_MAX, INT32_MAX), ZOLT_L_pow(1 << 30, INT32_MAX));
  EXPECT_EQ(ZOLT_L_pow(0, INT32_MAX), 0);
  EXPECT_EQ(ZOLT_L_pow(0, INT32_MIN), INT32_MAX);
  EXPECT_EQ(ZOLT_expintFix(0), ZOLT_expintFix(1));
  for (int64_t m = 21 * 4096 + 1; m <= INT32_MAX; m += 1 + m / 3000)  // beyond the exponential
    ASSERT_EQ(ZOLT_expintFix(static_cast<int32_t>(-m)), 0) << m;
  EXPECT_EQ(ZOLT_expintFix(INT32_MIN), 0);
}

TEST(Functions, AnglesTurnAndMirror) {
  for (int32_t angle = -INT32_MAX; angle < INT32_MAX - 26353590; angle += 99991) {
    ASSERT_EQ(ZOLT_L_sin(angle), ZOLT_L_sin(angle + 26353590)) << angle;
    ASSERT_EQ(ZOLT_L_sin(angle), -ZOLT_L_sin(-angle)) << angle;
  }
  // Steps of 1/256 begin at multiples of 2^14; the last covers the top, and pi turns over.
  EXPECT_EQ(ZOLT_L_sin((1 << 14) - 1), 0);
  EXPECT_EQ(ZOLT_L_sin(1 << 14), ZOLT_sinList[1]);
  EXPECT_EQ(ZOLT_L_sin(6588395), ZOLT_sinList[402]);
  EXPECT_EQ(ZOLT_L_sin(13176795 + (1 << 14)), -ZOLT_sinList[1]);
  EXPECT_EQ(ZOLT_L_sin(-13176795 - (1 << 14)), ZOLT_sinList[1]);
  EXPECT_EQ(ZOLT_L_cos(0), ZOLT_sinList[402]);
  for (int i = 1; i <= 900; ++i) {
    const auto angle = static_cast<int32_t>(i * 1317679.0 / 180);
    EXPECT_EQ(ZOLT_L_atan(ZOLT_atanList[i]), angle);
    EXPECT_LT(ZOLT_L_atan(ZOLT_atanList[i] - 1), angle);
    EXPECT_EQ(ZOLT_L_atan(-ZOLT_atanList[i]), -angle);
  }
  EXPECT_EQ(ZOLT_L_atan(INT32_MIN), -6588395);
  for (const int32_t r : {1, 1000, INT32_MAX}) {
    EXPECT_EQ(ZOLT_L_atan2(0, r), 0);
    EXPECT_EQ(ZOLT_L_atan2(r, 0), 6588395);
    EXPECT_EQ(ZOLT_L_atan2(0, -r), 13176795);
    EXPECT_EQ(ZOLT_L_atan2(-r, 0), -6588395);
    EXPECT_NEAR(ZOLT_L_atan2(-r, -r) / q22, -3 * pi / 4, 1e-6);
  }
  EXPECT_EQ(ZOLT_L_atan2(0, 0), 0);
  EXPECT_NEAR(ZOLT_L_atan2(INT32_MIN, INT32_MIN) / q22, -3 * pi / 4, 1e-6);
}

TEST(Functions, RootsAreOddAndFlagsStay) {
  const FlagWords flags = flags_of(ZOLT, 0, 1);
  write_flags(flags);
  for (const auto root : {ZOLT_L_cuberoot, ZOLT_L_root15}) {
    EXPECT_EQ(root(0), 0);
    EXPECT_EQ(root(INT32_MIN), -root(INT32_MAX));
    for (int32_t x = 1; x < INT32_MAX / 3; x *= 3) EXPECT_EQ(root(-x), -root(x)) << x;
  }
  for (const int32_t x : {INT32_MIN, 0, INT32_MAX}) {
    ZOLT_L_log(x);
    ZOLT_L_exp(x);
    ZOLT_L_pow(x, INT32_MIN);
    ZOLT_expintFix(x);
    ZOLT_L_atan2(x, ZOLT_L_sin(x));
  }
  EXPECT_EQ(read_flags(), flags);
}

}  // namespace
}  // namespace orvalis::test
