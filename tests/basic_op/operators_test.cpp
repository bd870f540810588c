// Laws of the operators in double precision and in 64 bits. Their bits are held by the digests.
#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <cstdlib>
#include <utility>

#include "basic_op.h"
#include "tests/support/flag_words.h"
#include "tests/support/random.h"

namespace orvalis::test {
namespace {

std::int64_t clip16(std::int64_t x) { return std::clamp<std::int64_t>(x, INT16_MIN, INT16_MAX); }
std::int64_t clip32(std::int64_t x) { return std::clamp<std::int64_t>(x, INT32_MIN, INT32_MAX); }

TEST(Operators, SaturateAndSaySo) {
  std::mt19937_64 random = seeded_generator();
  for (int i = 0; i < 200000; ++i) {
    const auto a = static_cast<int16_t>(random()), b = static_cast<int16_t>(random() | 1);
    const auto x = static_cast<int32_t>(random()), y = static_cast<int32_t>(random());
    const auto n = static_cast<int16_t>(random() % 32);
    const auto holds = [](auto operation, auto zolt, std::int64_t exact, std::int64_t held) {
      write_flags(flags_of(PLAIN, 0, 7));
      ASSERT_EQ(operation(), held);
      ASSERT_EQ(read_flags(), flags_of(PLAIN, exact != held, 7));
      ASSERT_EQ(zolt(), held);
      ASSERT_EQ(read_flags(), flags_of(PLAIN, exact != held, 7)) << "ZOLT_ saturates silently";
    };
    const auto sum = a + b, difference = a - b, product = (a * b + 0x4000) >> 15;
    const std::int64_t mac = x + 2LL * a * b;
    holds([&] { return add(a, b); }, [&] { return ZOLT_add(a, b); }, sum, clip16(sum));
    holds([&] { return sub(a, b); }, [&] { return ZOLT_sub(a, b); }, difference,
          clip16(difference));
    holds([&] { return mult_r(a, b); }, [&] { return ZOLT_mult_r(a, b); }, product,
          clip16(product));
    holds([&] { return L_mac(x, a, b); }, [&] { return ZOLT_L_mac(x, a, b); }, mac, clip32(mac));
    ASSERT_EQ(L_sub(x, y), clip32(std::int64_t{x} - y));
    ASSERT_EQ(L_shr(x, n), std::int64_t{x} >> n);
    ASSERT_EQ(L_shl(x, n), clip32(x * (std::int64_t{1} << n))) << x << " << " << n;
    ASSERT_EQ(shl(a, n), clip16(a * (std::int64_t{1} << n))) << a << " << " << n;
    if (x != 0) {
      ASSERT_GE(std::abs(std::ldexp(x, norm_l(x)) + 0.5), 0x1p30) << x;
    }
  }
}

TEST(Operators, CarryMakesSixtyFourBits) {
  std::mt19937_64 random = seeded_generator();
  for (int i = 0; i < 100000; ++i) {
    const std::uint64_t a = random(), b = random();
    write_flags(flags_of(PLAIN, 0, 0));
    const auto low =
        static_cast<std::uint32_t>(L_add_c(static_cast<int32_t>(a), static_cast<int32_t>(b)));
    const auto high = static_cast<std::uint32_t>(
        L_add_c(static_cast<int32_t>(a >> 32), static_cast<int32_t>(b >> 32)));
    ASSERT_EQ(std::uint64_t{high} << 32 | low, a + b);
  }
}

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

// They end with status 0, so only a child shows that they do, and that others do not.
TEST(ZoltDivisionDeathTest, EndsTheProcessOutOfRangeOnly) {
  EXPECT_EXIT(ZOLT_div_s(5, 3), testing::ExitedWithCode(0), "");
  EXPECT_EXIT(ZOLT_div_s(0, 0), testing::ExitedWithCode(0), "");
  for (const auto &[a, b] : {std::pair{1, 0}, {-1, 0}, {1, -1}, {-1, 1}})
    EXPECT_EXIT(ZOLT_div_l(a, static_cast<int16_t>(b)), testing::ExitedWithCode(0), "");
  EXPECT_EXIT(
      std::_Exit(ZOLT_div_s(0, 3) == 0 && ZOLT_div_s(3, 3) > 0 && ZOLT_div_l(6, 1) == 3 ? 7 : 1),
      testing::ExitedWithCode(7), "");
}

TEST(LogExp, Accuracy) {
  constexpr double q26 = 1 << 26, q31 = 2147483648.0;
  double log2_error = 0, fn_log2_error = 0, fn_log10_error = 0, exp2_error = 0, exp10_error = 0,
         root_error = 0;
  const auto worst = [](double &error, double now) { error = std::max(error, std::abs(now)); };
  for (int32_t x = 1; x < INT32_MAX / 1.0003; x += 1 + x / 4096) {
    int16_t exponent, fraction;
    Log2(x, &exponent, &fraction);
    worst(log2_error, fraction / 32768.0 + exponent - std::log2(x));
    worst(fn_log2_error, fnLog2(x) / q26 - std::log2(x / q31));
    worst(fn_log10_error, fnLog10(x) / q26 - std::log10(x / q31));
    if (x >= 0x40000000) worst(root_error, sqroot(x) - 32768 * std::sqrt(x / q31));
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
  EXPECT_LT(root_error, 20);
}

TEST(BlockScaling, LeavesTheHeadroomAskedForAndGoesBack) {
  std::mt19937_64 random = seeded_generator();
  for (int round = 0; round < 2000; ++round) {
    int16_t block[20], original[20];
    for (int16_t &x : block) x = static_cast<int16_t>(static_cast<int16_t>(random()) >> round % 14);
    std::copy(std::begin(block), std::end(block), original);
    const auto headroom = static_cast<int16_t>(random() % 3);
    const int16_t shift = block_norm_AL(block, 19, headroom);
    int peak = 0;
    for (int i = 0; i < 19; ++i) peak = std::max(peak, std::abs(int{block[i]}));
    EXPECT_GE(peak, 0x4000 >> headroom);
    EXPECT_LE(peak, 0x8000 >> headroom);
    EXPECT_EQ(block[19], original[19]);
    if (shift < 0) continue;
    block_denorm_AL(block, 19, shift);
    EXPECT_TRUE(std::equal(std::begin(block), std::end(block), original));
  }
}

}  // namespace
}  // namespace orvalis::test
