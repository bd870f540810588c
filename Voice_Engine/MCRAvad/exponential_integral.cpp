// E1(x) is the integral of e^-t / t from x to infinity.
//
// Near 0 by its series, further out by its continued fraction, each until a step changes less than
// 0.001. The sign of a polynomial with the root 3.016 selects one: there both take about the same
// work.
// Formulas: Abramowitz and Stegun, Handbook of Mathematical Functions, 5.1.11 and 5.1.22.
#include "Voice_Engine/MCRAvad/exponential_integral.h"

#include "Voice_Engine/MCRAvad/wide_arithmetic.h"
#include "Voice_Engine/MCRAvad/zolt_log_exp.h"

namespace orvalis {
namespace {

constexpr Word64 kOne = Word64{1} << 32;
constexpr Word64 kNegligible = 4194305;  // just above 2^-10 in Q32

/// a * x with a in Q32 and x in Q12, saturated before the lower half is added, which may wrap.
constexpr Word64 times_q12(Word64 a, Word32 x) {
  return wrapping_add(L64_shl(upper_half(a) * x, 20), (lower_half(a) * x + (1 << 11)) >> 12);
}

/// -gamma - ln x + x - x^2 / (2 * 2!) + x^3 / (3 * 3!) - ... for m in Q12 up to 3.02.
Word64 by_series(Word32 m) {
  constexpr Word64 kGamma = 2479122404;   // Q32
  constexpr Word64 kFourLn2 = 186065279;  // Q26: ln_q26 takes m for Q16
  Word64 sum = -((ln_q26(static_cast<std::uint32_t>(m)) + kFourLn2) * 64 + kGamma);
  Word64 power = Word64{m} << 20;  // x^k / k!, at most 4.6: times m it stays below 2^49
  Word64 term = power;
  for (int k = 2; L64_abs(term) >= kNegligible; ++k) {
    sum += term;
    power = -((power * m) >> 12) / k;
    term = power / k;
  }
  return sum;
}

/// Numerators and denominators of two successive convergents, scaled so that the last denominator
/// is 1. Every value stays within 0..2^32, but for the first denominator, which is x.
struct Convergents {
  Word64 previous_numerator = 0;
  Word64 previous_denominator = kOne;
  Word64 numerator = kOne;
  Word64 denominator;

  /// Moves on to the next convergent, numerator / denominator.
  void advance(Word64 next_numerator, Word64 next_denominator) {
    const Word64 divisor = next_denominator >> 12;  // at least 2^20: denominators are above 1
    previous_numerator = L64_quotient<20>(numerator, divisor);
    previous_denominator = L64_quotient<20>(denominator, divisor);
    numerator = L64_quotient<20>(next_numerator, divisor);
    denominator = kOne;
  }
};

/// e^-x * (1 / (x + 1 / (1 + 1 / (x + 2 / (1 + 2 / (x + ...)))))).
Word64 by_continued_fraction(Word32 m) {
  const auto times_m = [m](Word64 a) { return (a * m) >> 12; };
  Convergents c{.denominator = Word64{m} << 20};
  Word64 even = 0;
  for (int j = 1;; ++j) {
    c.advance(c.numerator + j * c.previous_numerator, c.denominator + j * c.previous_denominator);
    even = c.numerator;
    c.advance(times_m(c.numerator) + j * c.previous_numerator,
              times_m(c.denominator) + j * c.previous_denominator);
    if (L64_abs(c.numerator - even) < kNegligible) break;
  }
  // The fraction is below 1/3 and the exponential below 1/20.
  return (c.numerator * exp_q32(-saturated_word32(Word64{m} << 14))) >> 32;
}

}  // namespace

Word64 polynomial_q32(const Word64 *coefficients, Word32 x, Word32 terms) {
  Word64 sum = coefficients[0];
  Word64 result = sum;
  for (int j = 1; j < kPolynomialTerms; ++j) {
    sum = wrapping_add(times_q12(sum, x), coefficients[j]);
    if (j < terms) result = sum;
  }
  return result;
}

Word64 expint_q32(Word32 x) {
  constexpr Word64 kSelector[kPolynomialTerms] = {
      -16, -2070, -110360, -2995221, -43790350, -335517017, -1293830076, -3338824823, 35509337700};
  const Word32 magnitude = saturated_word32(L64_abs(x));
  const Word32 m = magnitude == 0 ? 1 : magnitude;
  return polynomial_q32(kSelector, m, kPolynomialTerms) >= 0 ? by_series(m)
                                                             : by_continued_fraction(m);
}

}  // namespace orvalis
