// Angles and roots of the extended mathematics against double precision.
#include <gtest/gtest.h>

#include <cmath>
#include <numbers>

#include "Math_baseop.h"
#include "tests/support/error_range.h"
#include "tests/support/flag_words.h"
#include "tests/support/random.h"

namespace orvalis::test {
namespace {

constexpr double q11 = 1 << 11, q22 = 1 << 22, q31 = 2147483648.0, pi = std::numbers::pi;

TEST(Angles, Tables) {
  for (int i = 0; i < 900; ++i)
    EXPECT_EQ(ZOLT_atanList[i], std::lround(q11 * std::tan(i * pi / 1800))) << i;
  EXPECT_EQ(ZOLT_atanList[900], 1171822423);
  for (int i = 0; i < 403; ++i)
    EXPECT_EQ(ZOLT_sinList[i], std::lround(q31 * std::sin(i / 256.0))) << i;
}

TEST(Angles, SineAndCosine) {
  ErrorRange sine, cosine;
  for (int64_t wide = INT32_MIN; wide <= INT32_MAX; wide += 4001) {
    const auto angle = static_cast<int32_t>(wide);
    sine.take(ZOLT_L_sin(angle) / q31 - std::sin(angle / q22));
    cosine.take(ZOLT_L_cos(angle) / q31 - std::cos(angle / q22));
    if (wide + 26353590 <= INT32_MAX) {
      ASSERT_EQ(ZOLT_L_sin(angle), ZOLT_L_sin(angle + 26353590)) << angle;
    }
    if (angle != INT32_MIN) {
      ASSERT_EQ(ZOLT_L_sin(angle), -ZOLT_L_sin(-angle)) << angle;
    }
  }
  EXPECT_ERRORS(sine, -0.004, 0.004);
  EXPECT_ERRORS(cosine, -0.004, 0.004);

  // Steps of 1/256 begin at multiples of 2^14; the last covers the top, and pi turns over.
  EXPECT_EQ(ZOLT_L_sin(0), 0);
  EXPECT_EQ(ZOLT_L_sin((1 << 14) - 1), 0);
  EXPECT_EQ(ZOLT_L_sin(-(1 << 14)), -ZOLT_sinList[1]);
  EXPECT_EQ(ZOLT_L_sin(6588394), ZOLT_sinList[402]);
  EXPECT_EQ(ZOLT_L_sin(6588395), ZOLT_sinList[402]);
  EXPECT_EQ(ZOLT_L_sin(13176795 - (1 << 14)), ZOLT_sinList[1]);
  EXPECT_EQ(ZOLT_L_sin(13176795 + (1 << 14)), -ZOLT_sinList[1]);
  EXPECT_EQ(ZOLT_L_sin(-13176795 - (1 << 14)), ZOLT_sinList[1]);
  EXPECT_EQ(ZOLT_L_cos(0), ZOLT_sinList[402]);
  EXPECT_EQ(ZOLT_L_cos(13176795), -ZOLT_sinList[402]);
}

TEST(Angles, Arctangent) {
  ErrorRange error;
  int index = 0;
  for (int64_t wide = 0; wide <= INT32_MAX; wide += 1 + wide / 30000) {
    const auto tangent = static_cast<int32_t>(wide);
    while (index < 900 && ZOLT_atanList[index + 1] <= tangent) ++index;
    ASSERT_EQ(ZOLT_L_atan(tangent), static_cast<int>(index * 1317679.0 / 180)) << tangent;
    ASSERT_EQ(ZOLT_L_atan(-tangent), -ZOLT_L_atan(tangent)) << tangent;
    error.take(ZOLT_L_atan(tangent) / q22 - std::atan(tangent / q11));
  }
  EXPECT_ERRORS(error, -0.00175, 0.00024);
  for (int i = 0; i < 900; ++i)
    EXPECT_NEAR(ZOLT_L_atan(ZOLT_atanList[i]) / q22, i * pi / 1800, 1e-6) << i;
  EXPECT_EQ(ZOLT_L_atan(INT32_MAX), 6588395);
  EXPECT_EQ(ZOLT_L_atan(INT32_MIN), -6588395);
}

TEST(Angles, FullCircle) {
  std::mt19937_64 random = seeded_generator();
  ErrorRange error;
  for (int i = 0; i < 500000; ++i) {
    const int32_t x = static_cast<int32_t>(random()) >> random() % 31;
    const int32_t y = static_cast<int32_t>(random()) >> random() % 31;
    if (y != 0) error.take(ZOLT_L_atan2(y, x) / q22 - std::atan2(y, x));
  }
  EXPECT_ERRORS(error, -0.00186, 0.00186);
  // Axes and diagonals, at every length.
  for (const int32_t r : {1, 1000, INT32_MAX}) {
    EXPECT_EQ(ZOLT_L_atan2(0, r), 0);
    EXPECT_EQ(ZOLT_L_atan2(r, 0), 6588395);
    EXPECT_EQ(ZOLT_L_atan2(0, -r), 13176795);
    EXPECT_EQ(ZOLT_L_atan2(-r, 0), -6588395);
    for (const int quadrant : {1, 3}) {
      const int32_t x = quadrant == 1 ? r : -r;
      EXPECT_NEAR(ZOLT_L_atan2(r, x) / q22, quadrant * pi / 4, 1e-6);
      EXPECT_NEAR(ZOLT_L_atan2(-r, x) / q22, -quadrant * pi / 4, 1e-6);
    }
  }
  EXPECT_EQ(ZOLT_L_atan2(0, 0), 0);
  EXPECT_NEAR(ZOLT_L_atan2(INT32_MIN, INT32_MIN) / q22, -3 * pi / 4, 1e-6);
}

TEST(Roots, Accuracy) {
  ErrorRange cube, root15;
  for (int64_t wide = 1; wide <= INT32_MAX; wide += 1 + wide / 300000) {
    const auto x = static_cast<int32_t>(wide);
    cube.take(ZOLT_L_cuberoot(x) - std::cbrt(x / q31) * q31);
    root15.take(ZOLT_L_root15(x) - std::pow(x / q31, 2.0 / 3) * q31);
    ASSERT_EQ(ZOLT_L_cuberoot(-x), -ZOLT_L_cuberoot(x)) << x;
    ASSERT_EQ(ZOLT_L_root15(-x), -ZOLT_L_root15(x)) << x;
  }
  EXPECT_ERRORS(cube, -63, 63);
  EXPECT_ERRORS(root15, -4, 4);
  EXPECT_EQ(ZOLT_L_cuberoot(0), 0);
  EXPECT_EQ(ZOLT_L_root15(0), 0);
  EXPECT_EQ(ZOLT_L_cuberoot(INT32_MIN), -ZOLT_L_cuberoot(INT32_MAX));
  EXPECT_EQ(ZOLT_L_root15(INT32_MIN), -ZOLT_L_root15(INT32_MAX));
  for (int k = 1; k <= 10; ++k) {  // roots of powers of 1/8 are powers of 1/2 and 1/4
    const int32_t power = 1 << (31 - 3 * k);
    EXPECT_NEAR(ZOLT_L_cuberoot(power), std::ldexp(q31, -k), 63) << k;
    EXPECT_NEAR(ZOLT_L_root15(power), std::ldexp(q31, -2 * k), 4) << k;
  }
}

TEST(Roots, TablesAreSeriesAndRemainders) {
  for (int i = 0; i <= 1000; ++i) {
    const double t = i / 500.0 - 1;
    const double m = (t - ZOLT_root15_const2) / ZOLT_root15_const1;
    double cube = 0, root15 = 0;
    for (int k = 7; k >= 0; --k) cube = cube * t + ZOLT_cuberoot_coeffs[k] / q31;
    for (int k = 13; k >= 0; --k) root15 = root15 * t + ZOLT_root15_fraction[k] / q31;
    EXPECT_NEAR(cube, std::cbrt(m), 3e-8) << m;
    EXPECT_NEAR(root15, std::pow(m, 2.0 / 3), 1e-9) << m;
  }
  for (int shift = 1; shift <= 2; ++shift) {
    EXPECT_EQ(ZOLT_cuberoot_fraction[shift - 1], std::lround(q31 * std::exp2(-shift / 3.0)));
    EXPECT_EQ(ZOLT_root15_coeffs[shift - 1], std::lround(q31 * std::exp2(-shift * 2 / 3.0)));
  }
}

TEST(AnglesAndRoots, FlagsStay) {
  const FlagWords flags = flags_of(ZOLT, 0, 1);
  write_flags(flags);
  for (const int32_t x : {INT32_MIN, -1, 0, 5, INT32_MAX}) {
    ZOLT_L_sin(x);
    ZOLT_L_cos(x);
    ZOLT_L_atan(x);
    ZOLT_L_atan2(x, -x / 3);
    ZOLT_L_cuberoot(x);
    ZOLT_L_root15(x);
  }
  EXPECT_EQ(read_flags(), flags);
}

}  // namespace
}  // namespace orvalis::test
