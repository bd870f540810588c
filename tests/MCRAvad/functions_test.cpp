// The functions of the extended mathematics: errors over their whole range, every bit where the
// steps are defined, and fixed points.
#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <numbers>

#include "Math_baseop.h"
#include "tests/support/fatal.h"
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
      const int64_t logarithm = (int64_t{ZOLT_L_log(2u * x)} * y + (1 << 30)) >> 31;
      ASSERT_EQ(ZOLT_L_pow(x, y), ZOLT_L_exp(static_cast<int32_t>(logarithm)) >> 17);
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

// ---- Bit for bit ----

TEST(Functions, LogarithmAsDefined) {
  for (int64_t x = 1; x <= UINT32_MAX; x += 1 + x / 5000) {
    int norm = -1;  // from 2^31 on; below, what brings x to 2^30..2^31 - 1
    while ((x << (norm + 1)) < int64_t{1} << 31) ++norm;
    const int64_t f = (norm < 0 ? x >> 1 : x << norm) / 32768 - 32768;
    int64_t sum = 0, power = f;
    for (const int c : {32749, -16106, 9456, -4426, 1040}) {
      sum += 2 * c * power;
      power = power * f / 32768;
    }
    const auto word = static_cast<uint32_t>(x);
    ASSERT_EQ(ZOLT_L_log(word), (14 - norm) * 46518272 + (sum >> 5)) << x;
    ASSERT_EQ(ZOLT_S_log(word), ((14 - norm) * int64_t{93036544} + (sum >> 4)) >> 16) << x;
  }
}

TEST(Functions, ExponentialAsDefined) {
  for (int64_t x = -1409286143; x <= 1409286143; x += 99991) {
    const int64_t y = (x * 1549082005 + (1 << 29)) >> 30;
    const int64_t whole = y >> 26, fraction = y & ((1 << 26) - 1);
    const int64_t fine = std::min<int64_t>((fraction % (1 << 19) + (1 << 12)) >> 13, 63);
    const uint64_t entries[] = {ZOLT_LPow2PlusFr1[fraction >> 19], ZOLT_LPow2PlusFr2[fine]};
    const auto v = static_cast<int64_t>((entries[0] * entries[1] + (1 << 29)) >> 30);
    const int64_t power = whole < 0 ? v * 4 >> -whole : v * 4 << whole;
    const auto word = static_cast<int32_t>(x);
    ASSERT_EQ(ZOLT_L_exp(word), power) << x;
    ASSERT_EQ(x < 0 ? L_exp_mius(word) : L_exp_plus(word), power) << x;
  }
}

/// The quotient a / b of the recurrence below: both are positive and b is below 2^40.
int64_t ratio(int64_t a, int64_t b) {
  const int64_t divisor = b >> 12;
  return a / divisor * (1 << 20) + a % divisor * (1 << 20) / divisor;
}

TEST(Functions, ExponentialIntegralAsDefined) {
  constexpr int64_t limit = 4194305, one = int64_t{1} << 32;
  // The selecting polynomial is positive up to 12354.
  for (int32_t m = 1; m < 90000; m += m < 12400 ? 1 : 50) {
    const int64_t x = int64_t{m} << 20;
    int64_t expected = -((ZOLT_L_log(m) + int64_t{186065279}) * 64 + 2479122404), power = x,
            term = x;
    for (int k = 2; m <= 12354 && std::abs(term) >= limit; ++k) {
      expected += term;
      power = -((power * m) >> 12) / k;
      term = power / k;
    }
    int64_t a1 = one, a2 = 0, b1 = x, b2 = one, even = 0, odd = limit;
    for (int j = 1; m > 12354 && std::abs(odd - even) >= limit; ++j)
      for (const bool is_odd : {false, true}) {
        const int64_t a = (is_odd ? a1 * m >> 12 : a1) + j * a2;
        const int64_t b = (is_odd ? b1 * m >> 12 : b1) + j * b2;
        a2 = ratio(a1, b);
        b2 = ratio(b1, b);
        a1 = ratio(a, b);
        b1 = one;
        (is_odd ? odd : even) = a1;
        expected = odd * ZOLT_L_exp(-(m << 14)) >> 32;
      }
    ASSERT_EQ(ZOLT_expintFix(m), expected) << m;
    ASSERT_EQ(ZOLT_expintFix(-m), expected) << m;
  }
}

TEST(Functions, Polynomial) {
  std::mt19937_64 random = seeded_generator();
  int64_t c[9];
  for (int i = 0; i < 5000; ++i) {
    for (int64_t &coefficient : c) coefficient = static_cast<int64_t>(random()) >> 30;
    const int32_t x = static_cast<int>(random() % 16384) - 8192;
    double value = static_cast<double>(c[0]);
    for (int n = 1; n <= 9; ++n) {
      if (n > 1) value = value * x / 4096 + static_cast<double>(c[n - 1]);
      // Each step rounds to a unit, which the next ones double at most.
      ASSERT_NEAR(static_cast<double>(ZOLT_POLYVALFix(c, x, n)), value, 256) << x << ", " << n;
    }
    ASSERT_EQ(ZOLT_POLYVALFix(c, x, 0), c[0]);
    ASSERT_EQ(ZOLT_POLYVALFix(c, x, 10), ZOLT_POLYVALFix(c, x, 9));
  }
  // A half rounds up; a product saturates; the sum with the coefficient wraps.
  const int64_t half[9] = {2048}, minus_half[9] = {-2048}, large[9] = {int64_t{1} << 62, 5};
  EXPECT_EQ(ZOLT_POLYVALFix(half, 1, 2), 1);
  EXPECT_EQ(ZOLT_POLYVALFix(minus_half, 1, 2), 0);
  EXPECT_EQ(ZOLT_POLYVALFix(large, 4 * 4096, 2), INT64_MIN + 4);
  EXPECT_EQ(ZOLT_POLYVALFix(large, -4 * 4096, 2), INT64_MIN + 5);
}

// ---- Fixed points, symmetry, corners ----

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

TEST(FunctionsDeathTest, PowerOfTwoOutOfRange) {
  constexpr char line[] =
      "Voice_Engine/MCRAvad/Math_baseop:2027 :: pow2 Overflow_ZOLT of too small Qx\n";
  EXPECT_FATAL(ZOLT_L_pow2_plus(-1, 26, 30, 1), 255, line);
  EXPECT_FATAL(ZOLT_L_pow2_plus(32768, 0, 30, 0), 255, line);
  EXPECT_FATAL(ZOLT_L_pow2_plus(1, INT16_MIN, 30, 1), 255, line);
}

// ---- Tables ----

TEST(Functions, Tables) {
  for (int i = 0; i < 128; ++i) {
    EXPECT_EQ(ZOLT_LPow2PlusFr1[i], std::llround(0x1p30 * std::exp2(i / 128.0))) << i;
    EXPECT_EQ(LPow2PlusFr1[i], ZOLT_LPow2PlusFr1[i]) << i;
    const double lagging = std::max(i / 2 - 1, 0) / 8192.0;
    EXPECT_EQ(ZOLT_LPow2PlusFr2[i / 2], std::llround(0x1p30 * std::exp2(lagging))) << i;
    EXPECT_EQ(LPow2PlusFr2[i / 2], ZOLT_LPow2PlusFr2[i / 2]) << i;
  }
  for (int k = 0; k < 19; ++k) {
    EXPECT_EQ(exp_coef_plus[k], std::llround(0x1p18 * std::exp(std::exp2(k - 15)))) << k;
    EXPECT_EQ(exp_coef_minus[k], std::llround(0x1p18 * std::exp(-std::exp2(k - 15)))) << k;
  }
  for (int i = 0; i < 900; ++i)
    EXPECT_EQ(ZOLT_atanList[i], std::lround(q11 * std::tan(i * pi / 1800))) << i;
  EXPECT_EQ(ZOLT_atanList[900], 1171822423);
  for (int i = 0; i < 403; ++i)
    EXPECT_EQ(ZOLT_sinList[i], std::llround(q31 * std::sin(i / 256.0))) << i;
  for (int shift = 1; shift <= 2; ++shift) {
    EXPECT_EQ(ZOLT_cuberoot_fraction[shift - 1], std::llround(q31 * std::exp2(-shift / 3.0)));
    EXPECT_EQ(ZOLT_root15_coeffs[shift - 1], std::llround(q31 * std::exp2(-shift * 2 / 3.0)));
  }
}

}  // namespace
}  // namespace orvalis::test
