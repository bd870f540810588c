// Logarithm, exponential and root: bits by their definition, and their errors.
#include <gtest/gtest.h>

#include <cmath>

#include "basic_op.h"
#include "expect_operator.h"

namespace orvalis::test {
namespace {

using definition::Flags;
using definition::Wide;

/// Whole part and fraction in one word.
int32_t log2_pair(int32_t x) {
  int16_t exponent, fraction;
  Log2(x, &exponent, &fraction);
  return exponent * 65536 + fraction;
}

TEST(LogExp, TableOfLog2) {
  for (int i = 0; i <= 32; ++i)
    EXPECT_EQ(tablog[i], std::min(std::llround(32768 * std::log2(1 + i / 32.0L)), 32767LL)) << i;
}

TEST(LogExp, AsDefined) {
  expect_operator("Log2", PLAIN, log2_pair, [](Flags &f, Wide x) -> Wide {
    if (x <= 0) return 0;
    f.overflow = 0;  // both parts pass through `sub`
    const Wide n = definition::norm_l(f, x);
    const Wide mantissa = x << n;  // Q30: 1 <= mantissa < 2
    const Wide entry = (mantissa >> 25) - 32, between = mantissa >> 10 & 0x7FFF;
    const Wide line =
        tablog[entry] * Wide{65536} + 2 * (tablog[entry + 1] - tablog[entry]) * between;
    return (30 - n) * 65536 + (line >> 16);
  });
  expect_operator("fnLog2", PLAIN, fnLog2, definition::fnLog2);
  expect_operator("fnLog2", NS, ns_fnLog2, definition::fnLog2);
  expect_operator("fnLog10", PLAIN, fnLog10, definition::fnLog10);
  expect_operator("fnLog10", NS, ns_fnLog10, definition::fnLog10);
}

/// The exponentials are defined up to 0 only.
template <int32_t (*exponential)(int32_t)>
int32_t up_to_zero(int32_t x) {
  return exponential(x > 0 ? -x : x);
}

TEST(LogExp, ExponentialsAsDefined) {
  const auto exp2 = [](Flags &f, Wide x) { return definition::fnExp2(f, x > 0 ? -x : x); };
  const auto exp10 = [](Flags &f, Wide x) { return definition::fnExp10(f, x > 0 ? -x : x); };
  expect_operator("fnExp2", PLAIN, up_to_zero<fnExp2>, exp2);
  expect_operator("fnExp2", NS, up_to_zero<ns_fnExp2>, exp2);
  expect_operator("fnExp10", PLAIN, up_to_zero<fnExp10>, exp10);
  expect_operator("fnExp10", NS, up_to_zero<ns_fnExp10>, exp10);
}

TEST(LogExp, Accuracy) {
  constexpr double q26 = 1 << 26, q31 = 2147483648.0;
  double log2_error = 0, fn_log2_error = 0, fn_log10_error = 0, exp2_error = 0, exp10_error = 0;
  const auto worst = [](double &error, double now) { error = std::max(error, std::abs(now)); };
  for (int32_t x = 1; x < INT32_MAX / 1.0003; x += 1 + x / 4096) {
    worst(log2_error, log2_pair(x) % 65536 / 32768.0 + log2_pair(x) / 65536 - std::log2(x));
    worst(fn_log2_error, fnLog2(x) / q26 - std::log2(x / q31));
    worst(fn_log10_error, fnLog10(x) / q26 - std::log10(x / q31));
  }
  // Down to 2^-12 and 10^-3.6, where the result still has bits enough for a relative error.
  for (int32_t x = -1 << 16; x > -12 * q26; x -= 9973) {
    worst(exp2_error, fnExp2(x) / q31 / std::exp2(x / q26) - 1);
    const double tenth = x / std::log2(10.0);
    worst(exp10_error, fnExp10(static_cast<int32_t>(tenth)) / q31 / std::exp2(x / q26) - 1);
  }
  EXPECT_LT(log2_error, 0.0002);
  EXPECT_LT(fn_log2_error, 0.0089);
  EXPECT_LT(fn_log10_error, 0.0028);
  EXPECT_LT(exp2_error, 0.0038);
  EXPECT_LT(exp10_error, 0.0038);
}

TEST(LogExp, RootFollowsItsSeriesAndLeavesFlags) {
  for (const Copy copy : {PLAIN, NS})
    for (int standing = 0; standing < 4; ++standing) {
      const FlagWords flags = flags_of(copy, standing & 1, standing >> 1);
      write_flags(flags);
      for (int32_t x = 0x40000000; x < 0x7FFE0000; x += 0x3FFF) {
        const double value = static_cast<double>(x) / 2147483648.0, d = value - 1;
        const double series = 1 + d / 2 - d * d / 8 + std::pow(d, 3) / 16 -
                              5 * std::pow(d, 4) / 128 + 7 * std::pow(d, 5) / 256;
        const int16_t root = (copy == NS ? ns_sqroot : sqroot)(x);
        ASSERT_NEAR(root, 32768 * series, 4) << x;
        ASSERT_NEAR(root, 32768 * std::sqrt(value), 20) << x;
      }
      EXPECT_EQ(read_flags(), flags);
      EXPECT_EQ((copy == NS ? ns_sqroot : sqroot)(INT32_MAX), 32767);
    }
}

}  // namespace
}  // namespace orvalis::test
