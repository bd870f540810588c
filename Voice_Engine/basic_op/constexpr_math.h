// Elementary functions for tables that are made at compile time. Accurate to about 1e-16 (exp_of
// and exp2_of relative), so that the rounding of no table entry is in doubt.
#pragma once

#include <array>
#include <cstddef>

#include "Voice_Engine/basic_op/word.h"

namespace orvalis::constexpr_math {

inline constexpr double kPi = 3.14159265358979323846;
inline constexpr double kLn2 = 0.693147180559945309417;

/// Taylor series of sine (first = 1) or cosine (first = 0) for |x| <= pi/4.
constexpr double sine_series(double x, int first) {
  double term = first == 1 ? x : 1.0;
  double sum = term;
  for (int n = first + 1; n < 24; n += 2) {
    term *= -x * x / (n * (n + 1));
    sum += term;
  }
  return sum;
}

/// cos(2 pi i / n), exact at the multiples of a quarter turn.
constexpr double cos_of_turn(double i, double n) {
  double turn = i / n;
  turn -= static_cast<double>(static_cast<long long>(turn));
  if (turn < 0) turn += 1;
  if (turn > 0.5) turn = 1 - turn;
  if (turn > 0.25) return -cos_of_turn(0.5 - turn, 1);
  return turn <= 0.125 ? sine_series(2 * kPi * turn, 0) : sine_series(2 * kPi * (0.25 - turn), 1);
}

/// sin(2 pi i / n), exact at the multiples of a quarter turn.
constexpr double sin_of_turn(double i, double n) { return cos_of_turn(i - n / 4, n); }

/// The unevaluated sum of two doubles: twice the precision of one.
/// Source: T. J. Dekker, "A floating-point technique for extending the available precision", 1971.
struct DoubleDouble {
  double hi = 0;
  double lo = 0;

  constexpr DoubleDouble operator-() const { return {-hi, -lo}; }
};

constexpr DoubleDouble two_sum(double a, double b) {
  const double sum = a + b;
  const double b_part = sum - a;
  return {sum, (a - (sum - b_part)) + (b - b_part)};
}

constexpr DoubleDouble two_product(double a, double b) {
  constexpr double kSplitter = 134217729;  // 2^27 + 1 splits a double into halves
  const double a_hi = kSplitter * a - (kSplitter * a - a);
  const double b_hi = kSplitter * b - (kSplitter * b - b);
  const double a_lo = a - a_hi;
  const double b_lo = b - b_hi;
  const double product = a * b;
  return {product, ((a_hi * b_hi - product) + a_hi * b_lo + a_lo * b_hi) + a_lo * b_lo};
}

constexpr DoubleDouble operator+(DoubleDouble a, DoubleDouble b) {
  const DoubleDouble sum = two_sum(a.hi, b.hi);
  return two_sum(sum.hi, sum.lo + (a.lo + b.lo));
}

constexpr DoubleDouble operator*(DoubleDouble a, DoubleDouble b) {
  const DoubleDouble product = two_product(a.hi, b.hi);
  return two_sum(product.hi, product.lo + (a.hi * b.lo + a.lo * b.hi));
}

/// Taylor series of the sine for |x| <= pi/2, to about 30 digits.
constexpr DoubleDouble sine_series(DoubleDouble x) {
  const DoubleDouble square = -(x * x);
  DoubleDouble sum = {1, 0};
  for (int n = 31; n > 1; n -= 2) {  // Horner's scheme over 1 - x^2/(2*3) (1 - x^2/(4*5) ...)
    const double divisor = n * (n - 1);
    const double quotient = 1 / divisor;
    const DoubleDouble reciprocal =
        two_sum(quotient, -(two_product(quotient, divisor) + DoubleDouble{-1, 0}).hi / divisor);
    sum = DoubleDouble{1, 0} + sum * square * reciprocal;
  }
  return x * sum;
}

/// pi/2 less `x`, for 0 <= x <= pi.
constexpr DoubleDouble quarter_turn_less(double x) {
  constexpr double kHalfPi[] = {1.5707963267948966, 6.123233995736766e-17, -1.4973849048591833e-33};
  return two_sum(kHalfPi[0], -x) + DoubleDouble{kHalfPi[1], kHalfPi[2]};
}

/// Cosine of an angle of at most pi either way, rounded to the nearest double.
constexpr double cos_of(double radians) {
  return sine_series(quarter_turn_less(radians < 0 ? -radians : radians)).hi;
}

/// Sine of an angle of at most pi either way, rounded to the nearest double; keeps the sign of 0.
constexpr double sin_of(double radians) {
  if (radians < 0) return -sin_of(-radians);
  if (radians <= kPi / 2) return radians == 0 ? radians : sine_series({radians, 0}).hi;
  const DoubleDouble beyond = quarter_turn_less(radians);  // pi - x = pi/2 + (pi/2 - x)
  return sine_series(quarter_turn_less(0) + beyond).hi;
}

/// Square root for x >= 0, by Newton's method from above, to within an ulp.
constexpr double sqrt_of(double x) {
  if (x == 0) return 0;
  double root = x < 1 ? 1 : x;
  for (;;) {
    const double next = 0.5 * (root + x / root);
    if (!(next < root)) return root;
    root = next;
  }
}

/// Base-2 logarithm for x in 1..2, by the series of artanh.
constexpr double log2_of(double x) {
  const double z = (x - 1) / (x + 1);
  double power = z;
  double sum = 0;
  for (int n = 1; n < 60; n += 2) {
    sum += power / n;
    power *= z * z;
  }
  return 2 * sum / kLn2;
}

/// e^x for |x| <= 8, by its series for the magnitude: all terms are positive, nothing cancels.
constexpr double exp_of(double x) {
  if (x < 0) return 1 / exp_of(-x);
  double term = 1;
  double sum = 1;
  for (int n = 1; n < 60; ++n) {
    term *= x / n;
    sum += term;
  }
  return sum;
}

/// 2^x for |x| <= 8.
constexpr double exp2_of(double x) { return exp_of(x * kLn2); }

/// Rounds half away from zero and clips to 16 bits.
constexpr Word16 rounded_word16(double x) {
  const double rounded = x < 0 ? x - 0.5 : x + 0.5;
  if (rounded >= MAX_16) return MAX_16;
  return static_cast<Word16>(rounded <= MIN_16 ? MIN_16 : rounded);
}

}  // namespace orvalis::constexpr_math
