// Elementary functions for tables that are made at compile time. Accurate to about 1e-16, so that
// no rounding to 16 bits is ever in doubt.
#pragma once

#include <array>
#include <cstddef>

#include "Voice_Engine/basic_op/word.h"

namespace orvalis::constexpr_math {

inline constexpr double kPi = 3.14159265358979323846;

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

/// Base-2 logarithm for x in 1..2, by the series of artanh.
constexpr double log2_of(double x) {
  constexpr double kLn2 = 0.693147180559945309417;
  const double z = (x - 1) / (x + 1);
  double power = z;
  double sum = 0;
  for (int n = 1; n < 60; n += 2) {
    sum += power / n;
    power *= z * z;
  }
  return 2 * sum / kLn2;
}

/// Rounds half away from zero and clips to 16 bits.
constexpr Word16 rounded_word16(double x) {
  const double rounded = x < 0 ? x - 0.5 : x + 0.5;
  if (rounded >= MAX_16) return MAX_16;
  return static_cast<Word16>(rounded <= MIN_16 ? MIN_16 : rounded);
}

}  // namespace orvalis::constexpr_math
