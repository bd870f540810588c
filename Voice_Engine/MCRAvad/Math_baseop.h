/*
 * Math_baseop.h - the extended fixed-point mathematics of libOrvalis.so
 *
 * Elementary functions, 64-bit helpers and windows in fixed point. Qn means n bits behind the
 * binary point: 1.0 in Q26 is 2^26. Maximum errors are against the exact result, and tested.
 *
 *   function            argument        result   maximum error
 *   ZOLT_L_log          Q16 (unsigned)  Q26      0.00047
 *   ZOLT_S_log          Q16 (unsigned)  Q11      0.00094
 *   ZOLT_L_exp          Q26             Q32      0.00017 relative and 1 unit, always too small
 *   ZOLT_L_pow2_plus    any Q           any Q    0.00017 relative, and the rounding
 *   ZOLT_L_pow          Q15, Q31        Q15      0.00065 relative and 1 unit
 *   ZOLT_expintFix      Q12             Q32      0.0013
 *   ZOLT_L_sin, _cos    Q22             Q31      0.0040
 *   ZOLT_L_atan         Q11             Q22      0.00175
 *   ZOLT_L_atan2        any             Q22      0.00186
 *   ZOLT_L_cuberoot     Q31             Q31      63 units (3e-8)
 *   ZOLT_L_root15       Q31             Q31      4 units (2e-9)
 *
 * Results saturate. No function here touches a flag. Three conditions print a line on standard
 * output and END THE PROCESS with exit status -1 (255 to a shell): a division by 0 in ZOLT_L64_div,
 * a negative ZOLT_L64_sqrt_Q0, an exponent out of range in ZOLT_L_pow2_plus. Check them first.
 *
 * Every function may be called from any thread. Pointers must be valid; nothing is checked.
 */
#ifndef ORVALIS_MATH_BASEOP_H
#define ORVALIS_MATH_BASEOP_H

#include <stdint.h>

#ifdef __cplusplus
extern "C" {
#endif

/* ---- Logarithm and exponential -------------------------------------------------------------- */

/* ln(x) in Q26 of x in Q16, so ZOLT_L_log(65536) is 0; INT32_MIN for 0. */
int32_t ZOLT_L_log(uint32_t x);
/* ln(x) in Q11 of x in Q16, truncated; INT16_MIN for 0. */
int16_t ZOLT_S_log(uint32_t x);

/* e^x in Q32 of x in Q26: 0 for x <= -21, 0x4E9B87F67BB3F559 (e^21) for x >= 21. */
int64_t ZOLT_L_exp(int32_t x);
/* Its halves, for x >= 0 and for x < 0; each is valid for any x. */
int64_t L_exp_plus(int32_t x);
int64_t L_exp_mius(int32_t x);

/* 2^(x / 2^q) in Qout_q, rounded half up, at most INT32_MAX, for any q and out_q. Mode 0 uses one
 * table entry (maximum error 0.55 %), any other mode the product of two. Ends the process unless
 * 0 <= x / 2^q < 32768. */
int32_t ZOLT_L_pow2_plus(int32_t x, int16_t q, int16_t out_q, uint16_t mode);

/* x^y in Q15 of x > 0 in Q15 and y in Q31. Larger x count as 32768 - 2^-16. A negative x has no
 * power; its doubled bits are read as an unsigned Q16 value. */
int32_t ZOLT_L_pow(int32_t x, int32_t y);

/* Factors of f, f^2 ... f^5 in Q15, which add up to ln(1 + f) in ZOLT_L_log. */
extern const int16_t ZOLT_ln_coeffs[5];
/* 2^(i / 128) in Q30, and 2^((i - 1) / 8192) in Q30 with 1.0 at entry 0. */
extern const uint32_t ZOLT_LPow2PlusFr1[128];
extern const uint32_t ZOLT_LPow2PlusFr2[64];
/* The same tables under other names. */
extern const uint32_t LPow2PlusFr1[128];
extern const uint32_t LPow2PlusFr2[64];
/* e^(2^(k - 15)) and e^(-2^(k - 15)) in Q18. No function reads them. */
extern const int32_t exp_coef_plus[19];
extern const int32_t exp_coef_minus[19];

/* ---- Exponential integral ------------------------------------------------------------------- */

/* E1(|x|) in Q32 of x in Q12: the integral of e^-t / t from |x| on. 0 counts as 1/4096. */
int64_t ZOLT_expintFix(int32_t x);
/* Horner's scheme: the value in Q32 after the first n of nine coefficients in Q32, highest power
 * first, at x in Q12. All nine are read. n counts as 1 below 1 and as 9 above 9. A product
 * saturates, a sum wraps. */
int64_t ZOLT_POLYVALFix(const int64_t *coefficients, int32_t x, int32_t n);

/* ---- 64 bits -------------------------------------------------------------------------------- */

/* a / b in Q10, truncated toward zero. Ends the process if b is 0. */
int64_t ZOLT_L64_div(int64_t a, int64_t b);
/* a * b in Q32. Bit 0 of either factor is ignored, so the result is mostly too small, by up to
 * |a| + |b| + 1 units with a and b as numbers in Q32. Saturates; but if both factors are negative
 * and the upper halves alone exceed the range, the result falls short of the maximum. */
int64_t ZOLT_L64_mult(int64_t a, int64_t b);
/* a * b / 2^32, rounded down. */
int64_t ZOLT_LL_mult_64a32(int64_t a, int32_t b);
/* Root of an integer, rounded up where x is not below r * r + r with r the root rounded down, so 1
 * for 0; at most INT32_MAX. Ends the process if x is negative. */
int32_t ZOLT_L64_sqrt_Q0(int64_t x);
/* |x|, INT64_MAX for INT64_MIN. */
int64_t ZOLT_L64_abs(int64_t x);
double ZOLT_abs_double(double x);
/* Greatest common divisor of |a| and |b|, at most INT32_MAX; |a| if b is 0. */
int32_t ZOLT_get_gcd(int32_t a, int32_t b);

/* ---- Angles --------------------------------------------------------------------------------- */

/* Sine and cosine in Q31 of any angle in Q22 radians, by table without interpolation. */
int32_t ZOLT_L_sin(int32_t angle);
int32_t ZOLT_L_cos(int32_t angle);
/* Angle in Q22 radians of a tangent in Q11, rounded down to a tenth of a degree. */
int32_t ZOLT_L_atan(int32_t tangent);
/* Angle of the point (x, y) in Q22 radians, -pi to pi; 0 for (0, 0). */
int32_t ZOLT_L_atan2(int32_t y, int32_t x);

/* Tangents of 0, 0.1, 0.2 ... degrees in Q11; the last is that of 89.9999 degrees. */
extern const int32_t ZOLT_atanList[901];
/* sin(i / 256) in Q31. */
extern const int32_t ZOLT_sinList[403];

/* ---- Roots ---------------------------------------------------------------------------------- */

/* x^(1/3), Q31 to Q31, with the sign of x. */
int32_t ZOLT_L_cuberoot(int32_t x);
/* The y of y^1.5 = x, which is x^(2/3), Q31 to Q31; with the sign of x below 0. */
int32_t ZOLT_L_root15(int32_t x);

/* Polynomials in t = const1 * m + const2 = 4 m - 3, in Q31 from t^0 on, for the cube root and the
 * 1.5th root of a mantissa m in 1/2..1; and the roots of 1/2 and 1/4 in Q31. */
extern const int32_t ZOLT_cuberoot_coeffs[8];
extern const int32_t ZOLT_cuberoot_fraction[2];
extern const int32_t ZOLT_root15_fraction[14];
extern const int32_t ZOLT_root15_coeffs[2];
extern const int32_t ZOLT_root15_const1;
extern const int32_t ZOLT_root15_const2;

/* ---- Windows: n values weighted in place ---------------------------------------------------- */

void ZOLT_S_addHamFix(int32_t n, int16_t *x, const int16_t *w); /* Q15, rounded half up */
void ZOLT_I_addHamFix(int32_t n, int32_t *x, const int32_t *w); /* Q31, truncated */
/* Weights in Q31, rounded half up. */
void ZOLT_L64_addHamFix(int32_t n, int64_t *x, const int32_t *w);

/* Hann windows: of a frame in Q15, of the neighbours of a bin in Q31 (sums 4 and 20). */
extern const int16_t ZOLT_vadHamTable1[160];
extern const int32_t ZOLT_vadHamTable2[9];
extern const int32_t ZOLT_vadHamTable3[41];

#ifdef __cplusplus
}
#endif

#endif /* ORVALIS_MATH_BASEOP_H */
