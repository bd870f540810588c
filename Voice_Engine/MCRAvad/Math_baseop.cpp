// The exported extended mathematics: one line for each, forwarding to the library's own functions.
#include "Voice_Engine/MCRAvad/Math_baseop.h"

#include <cmath>
#include <cstdio>
#include <cstdlib>
#include <numeric>

#include "Voice_Engine/MCRAvad/angles.h"
#include "Voice_Engine/MCRAvad/exponential_integral.h"
#include "Voice_Engine/MCRAvad/roots.h"
#include "Voice_Engine/MCRAvad/wide_arithmetic.h"
#include "Voice_Engine/MCRAvad/windows.h"
#include "Voice_Engine/MCRAvad/zolt_log_exp.h"

namespace {

int64_t checked_quotient_q10(int64_t a, int64_t b) {
  if (b == 0) {
    std::printf("<%s::%d>--Error with Division by 0\n", orvalis::kMathSource, 1954);
    std::exit(-1);
  }
  return orvalis::L64_quotient<10>(a, b);
}

int32_t checked_root(int64_t x) {
  if (x < 0) {
    std::printf("<%s::%ds> sqrt error with negative input\n", orvalis::kMathSource, 1910);
    std::exit(-1);
  }
  return orvalis::L64_root(x);
}

/// Only gcd(INT32_MIN, 0 or INT32_MIN), 2^31, is out of range: it saturates.
int32_t greatest_common_divisor(int32_t a, int32_t b) {
  return orvalis::saturated_word32(std::gcd(int64_t{a}, int64_t{b}));
}

constexpr orvalis::Lookup lookup_of(uint16_t mode) {
  return mode == 0 ? orvalis::Lookup::kOne : orvalis::Lookup::kTwo;
}

}  // namespace

#define EXPORTED(result, name, op, parameters, ...) \
  extern "C" ORVALIS_EXPORT result name parameters { return op(__VA_ARGS__); }

// clang-format off
EXPORTED(int32_t, ZOLT_L_log,       orvalis::ln_q26,  (uint32_t x), x)
EXPORTED(int16_t, ZOLT_S_log,       orvalis::ln_q11,  (uint32_t x), x)
EXPORTED(int64_t, ZOLT_L_exp,       orvalis::exp_q32, (int32_t x), x)
EXPORTED(int64_t, L_exp_plus,       orvalis::exp_q32, (int32_t x), x)
EXPORTED(int64_t, L_exp_mius,       orvalis::exp_q32, (int32_t x), x)
EXPORTED(int32_t, ZOLT_L_pow2_plus, orvalis::pow2,    (int32_t x, int16_t q, int16_t out_q, uint16_t mode), x, q, out_q, lookup_of(mode))
EXPORTED(int32_t, ZOLT_L_pow,       orvalis::pow_q15, (int32_t x, int32_t y), x, y)

EXPORTED(int64_t, ZOLT_expintFix,  orvalis::expint_q32,     (int32_t x), x)
EXPORTED(int64_t, ZOLT_POLYVALFix, orvalis::polynomial_q32, (const int64_t *coefficients, int32_t x, int32_t n), coefficients, x, n)

EXPORTED(int64_t, ZOLT_L64_div,        checked_quotient_q10,        (int64_t a, int64_t b), a, b)
EXPORTED(int64_t, ZOLT_L64_mult,       orvalis::L64_mult,           (int64_t a, int64_t b), a, b)
EXPORTED(int64_t, ZOLT_LL_mult_64a32,  orvalis::L64_mult_by_word32, (int64_t a, int32_t b), a, b)
EXPORTED(int32_t, ZOLT_L64_sqrt_Q0,    checked_root,                (int64_t x), x)
EXPORTED(int64_t, ZOLT_L64_abs,        orvalis::L64_abs,            (int64_t x), x)
EXPORTED(double,  ZOLT_abs_double,     std::fabs,                   (double x), x)
EXPORTED(int32_t, ZOLT_get_gcd,        greatest_common_divisor,     (int32_t a, int32_t b), a, b)

EXPORTED(int32_t, ZOLT_L_sin,      orvalis::sin_q31,       (int32_t angle), angle)
EXPORTED(int32_t, ZOLT_L_cos,      orvalis::cos_q31,       (int32_t angle), angle)
EXPORTED(int32_t, ZOLT_L_atan,     orvalis::atan_q22,      (int32_t tangent), tangent)
EXPORTED(int32_t, ZOLT_L_atan2,    orvalis::atan2_q22,     (int32_t y, int32_t x), y, x)
EXPORTED(int32_t, ZOLT_L_cuberoot, orvalis::cube_root_q31, (int32_t x), x)
EXPORTED(int32_t, ZOLT_L_root15,   orvalis::root15_q31,    (int32_t x), x)

EXPORTED(void, ZOLT_S_addHamFix,   orvalis::apply_window, (int32_t n, int16_t *x, const int16_t *w), n, x, w)
EXPORTED(void, ZOLT_I_addHamFix,   orvalis::apply_window, (int32_t n, int32_t *x, const int32_t *w), n, x, w)
EXPORTED(void, ZOLT_L64_addHamFix, orvalis::apply_window, (int32_t n, int64_t *x, const int32_t *w), n, x, w)
// clang-format on
