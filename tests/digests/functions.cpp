// The extended mathematics and its tables.
#include "Math_baseop.h"

#include "tests/digests/observe.h"
#include "tests/digests/sweep.h"

namespace orvalis::test {
namespace {

/// Whether 2^(x / 2^q) has an exponent that the function takes.
bool has_power(std::int32_t x, std::int16_t q) {
  if (x < 0 || q >= 31) return x >= 0;
  return q > -32 && (q >= 0 ? x >> q : static_cast<std::int64_t>(x) << -q) < 32768;
}

std::int64_t polynomial(std::int64_t seed, std::int32_t x, std::int16_t n) {
  Random random(static_cast<std::uint64_t>(seed));
  std::int64_t coefficients[9];
  for (std::int64_t &coefficient : coefficients) coefficient = random_word<std::int64_t>(random);
  return ZOLT_POLYVALFix(coefficients, x, n);
}

TEST(Digests, Functions) {
  Judge judge("functions");
#define SWEEP(function, ...) sweep(judge, #function, function __VA_OPT__(, ) __VA_ARGS__)
  SWEEP(ZOLT_L_log);
  SWEEP(ZOLT_S_log);
  SWEEP(ZOLT_L_exp);
  SWEEP(L_exp_plus);
  SWEEP(L_exp_mius);
  SWEEP(ZOLT_L_pow2_plus, [](std::int32_t x, std::int16_t q, std::int16_t, std::uint16_t) {
    return has_power(x, q);
  });
  SWEEP(ZOLT_L_pow);
  SWEEP(ZOLT_expintFix);
  SWEEP(polynomial);
  SWEEP(ZOLT_L64_div, [](std::int64_t, std::int64_t b) { return b != 0; });
  SWEEP(ZOLT_L64_mult);
  SWEEP(ZOLT_LL_mult_64a32);
  SWEEP(ZOLT_L64_sqrt_Q0, [](std::int64_t x) { return x >= 0; });
  SWEEP(ZOLT_L64_abs);
  SWEEP(ZOLT_get_gcd);
  SWEEP(ZOLT_L_sin);
  SWEEP(ZOLT_L_cos);
  SWEEP(ZOLT_L_atan);
  SWEEP(ZOLT_L_atan2);
  SWEEP(ZOLT_L_cuberoot);
  SWEEP(ZOLT_L_root15);

  judge.sequence("ZOLT_abs_double", [&] {
    for (const double x : {0.0, -0.0, 1.5, -1.5, 1e300, -1e300, -5e-324})
      judge.take(ZOLT_abs_double(x));
    judge.call();
  });
  judge.sequence("out-of-range", [&] {
    for (const std::int64_t x : {-2, -1, 0, 1}) {
      judge.take(last_words([&] { ZOLT_L64_div(5, x); }));
      judge.take(last_words([&] { ZOLT_L64_sqrt_Q0(x); }));
      for (const std::int16_t q : {-40, -32, -31, -15, 0, 14, 15, 16, 31, 40})
        for (const std::int32_t value : {static_cast<std::int32_t>(x), 32767, 32768, INT32_MAX})
          judge.take(last_words([&] { ZOLT_L_pow2_plus(value, q, 0, 1); }));
      judge.call();
    }
  });
  judge.sequence("windows", [&] {
    Random random(12);
    for (const std::int32_t n : {160, 41, 9, 1, 0, -1}) {
      std::int16_t shorts[160], short_weights[160];
      std::int32_t words[160], weights[160];
      std::int64_t longs[160];
      for (int i = 0; i < 160; ++i) {
        shorts[i] = random_word<std::int16_t>(random);
        short_weights[i] = random_word<std::int16_t>(random);
        words[i] = random_word<std::int32_t>(random);
        weights[i] = random_word<std::int32_t>(random);
        longs[i] = random_word<std::int64_t>(random);
      }
      ZOLT_S_addHamFix(n, shorts, short_weights);
      ZOLT_I_addHamFix(n, words, weights);
      ZOLT_L64_addHamFix(n, longs, weights);
      judge.take(shorts, words, longs);
      judge.call();
    }
  });
  judge.sequence("tables", [&] {
    const auto table = [&](const auto &values) {
      judge.take(values);
      judge.call();
    };
    table(ZOLT_ln_coeffs);
    table(ZOLT_LPow2PlusFr1);
    table(ZOLT_LPow2PlusFr2);
    table(LPow2PlusFr1);
    table(LPow2PlusFr2);
    table(exp_coef_plus);
    table(exp_coef_minus);
    table(ZOLT_atanList);
    table(ZOLT_sinList);
    table(ZOLT_cuberoot_coeffs);
    table(ZOLT_cuberoot_fraction);
    table(ZOLT_root15_fraction);
    table(ZOLT_root15_coeffs);
    table(ZOLT_root15_const1);
    table(ZOLT_root15_const2);
    table(ZOLT_vadHamTable1);
    table(ZOLT_vadHamTable2);
    table(ZOLT_vadHamTable3);
  });
}

}  // namespace
}  // namespace orvalis::test
