// Errors of the operators and of the extended mathematics over their whole range. Their bits are
// held by the digests.
#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>

#include "Math_baseop.h"
#include "basic_op.h"
#include "tests/support/random.h"

namespace orvalis::test {
namespace {

constexpr double q11 = 1 << 11, q15 = 1 << 15, q22 = 1 << 22, q26 = 1 << 26, q31 = 0x1p31;
constexpr double q32 = 0x1p32;

/// Arguments in steps that begin with 1 and grow with the argument up to `step`.
struct Sweep {
  const char *name;
  int64_t first, last, step;
  double lower, upper;
  double (*error)(int64_t x);
};

double log2_of(int64_t x) {
  int16_t exponent, fraction;
  Log2(static_cast<int32_t>(x), &exponent, &fraction);
  return fraction / 32768.0 + exponent;
}

#define ERROR(expression) [](int64_t x) -> double { return expression; }

// clang-format off
const Sweep sweeps[] = {
    {"log, Q26", 1, UINT32_MAX, 99999, -0.00047, 0.00047, ERROR(ZOLT_L_log(x) / q26 - std::log(x / 65536.0))},
    {"log, Q11", 1, UINT32_MAX, 99999, -0.00094, 0.00047, ERROR(ZOLT_S_log(x) / q11 - std::log(x / 65536.0))},
    {"exp, relative", -1 << 26, 0x53FFFFFF, 9973, -0.00017, 0, ERROR(ZOLT_L_exp(x) / q32 / std::exp(x / q26) - 1)},
    {"exp, units below that", -0x53FFFFFF, 0, 9973, -1, 0, ERROR(std::min(ZOLT_L_exp(x) - std::exp(x / q26) * q32 * (1 - 0.00017), 0.0))},
    {"pow2, one entry", 0, 1 << 20, 3, -0.0055, 0.0028, ERROR(ZOLT_L_pow2_plus(x, 20, 29, 0) / std::exp2(x / 0x1p20 + 29) - 1)},
    {"pow2, two entries", 0, 1 << 20, 3, -0.00017, 1e-9, ERROR(ZOLT_L_pow2_plus(x, 20, 29, 1) / std::exp2(x / 0x1p20 + 29) - 1)},
    {"expint by series", 1, 12354, 1, -0.0008, 0.0013, ERROR(ZOLT_expintFix(x) / q32 + std::expint(-x / 4096.0))},
    {"expint by fraction", 12355, 100000, 1, -6e-9, 9e-6, ERROR(ZOLT_expintFix(x) / q32 + std::expint(-x / 4096.0))},
    {"sin", INT32_MIN, INT32_MAX, 4001, -0.004, 0.004, ERROR(ZOLT_L_sin(x) / q31 - std::sin(x / q22))},
    {"cos", INT32_MIN, INT32_MAX, 4001, -0.004, 0.004, ERROR(ZOLT_L_cos(x) / q31 - std::cos(x / q22))},
    {"atan", 0, INT32_MAX, 99999, -0.00175, 0.00024, ERROR(ZOLT_L_atan(x) / q22 - std::atan(x / q11))},
    {"Log2", 1, INT32_MAX, 9973, -0.0002, 0.000016, ERROR(log2_of(x) - std::log2(x))},
    {"fnLog2", 1, INT32_MAX, 9973, -0.0067, 0.0089, ERROR(fnLog2(static_cast<int32_t>(x)) / q26 - std::log2(x / q31))},
    {"fnLog10", 1, INT32_MAX, 9973, -0.002, 0.0028, ERROR(fnLog10(static_cast<int32_t>(x)) / q26 - std::log10(x / q31))},
    {"fnExp2, relative", -12 << 26, -1 << 16, 9973, -0.0028, 0.0038, ERROR(fnExp2(static_cast<int32_t>(x)) / q31 / std::exp2(x / q26) - 1)},
    {"fnExp10, relative", -242000000, -1 << 16, 9973, -0.0028, 0.0038, ERROR(fnExp10(static_cast<int32_t>(x)) / q31 / std::pow(10, x / q26) - 1)},
    {"square root, units", 1 << 30, INT32_MAX, 9973, -1.5, 19, ERROR(sqroot(static_cast<int32_t>(x)) - 32768 * std::sqrt(x / q31))},
    {"cuberoot, units", 1, INT32_MAX, 9973, -63, 63, ERROR(ZOLT_L_cuberoot(x) - std::cbrt(x / q31) * q31)},
    {"root15, units", 1, INT32_MAX, 9973, -4, 4, ERROR(ZOLT_L_root15(x) - std::pow(x / q31, 2.0 / 3) * q31)}};
// clang-format on

TEST(Accuracy, OverTheWholeRange) {
  for (const auto &[name, first, last, step, lower, upper, error] : sweeps) {
    double least = error(last), most = least;
    for (int64_t x = first; x < last; x += std::min(1 + std::abs(x) / 1000, step)) {
      least = std::min(least, error(x));
      most = std::max(most, error(x));
    }
    // A bound that is much too wide proves nothing.
    EXPECT_TRUE(lower <= least && least <= 0.75 * lower && 0.75 * upper <= most && most <= upper)
        << name << ": " << least << " to " << most << ", not " << lower << " to " << upper;
  }
}

TEST(Accuracy, OfTwoArguments) {
  std::mt19937_64 random = seeded_generator();
  for (int i = 0; i < 400000; ++i) {
    const int32_t x = static_cast<int32_t>(random()) >> random() % 31;
    const int32_t y = static_cast<int32_t>(random()) >> random() % 31;
    if (y != 0) {
      ASSERT_NEAR(ZOLT_L_atan2(y, x) / q22, std::atan2(y, x), 0.00186) << y << ' ' << x;
    }
    const double truth = std::pow(x / q15, y / q31);
    if (x > 0 && x < 1 << 30 && truth < 65535) {
      ASSERT_NEAR(ZOLT_L_pow(x, y) / q15, truth, truth * 0.00065 + 1 / q15) << x << " ^ " << y;
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
}

}  // namespace
}  // namespace orvalis::test
