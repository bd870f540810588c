// Roots of x = mantissa * 2^-shift, with the mantissa in 1/2..1: a polynomial gives the root of the
// mantissa, a table that of shift % 3, and shift / 3 is a shift of the result. The polynomials
// interpolate at the Chebyshev nodes, which makes the maximum error nearly minimal.
#include "Voice_Engine/MCRAvad/roots.h"

#include <array>

#include "Voice_Engine/MCRAvad/wide_arithmetic.h"
#include "Voice_Engine/basic_op/constexpr_math.h"
#include "Voice_Engine/basic_op/hidden_table.h"
#include "Voice_Engine/basic_op/zolt_operators.h"

namespace {

using orvalis::Word32;
using orvalis::constexpr_math::cos_of_turn;

template <std::size_t kTerms>
using Series = std::array<Word32, kTerms>;

/// x^(thirds / 3) for x in 1/4..1 and 1 or 2 thirds, by Newton's method.
constexpr double power_of_thirds(double x, int thirds) {
  double root = 1;
  for (int i = 0; i < 30; ++i) root = (2 * root + x / (root * root)) / 3;
  return thirds == 1 ? root : root * root;
}

constexpr Word32 rounded_q31(double x) {
  return static_cast<Word32>(0x1p31 * x + (x < 0 ? -0.5 : 0.5));
}

/// Factors in Q31 of t^0, t^1 ... for ((t + 3) / 4)^(thirds / 3), t = -1..1.
template <std::size_t kTerms>
constexpr Series<kTerms> make_series(int thirds) {
  std::array<double, kTerms> sum{};
  std::array<double, kTerms> chebyshev{1};  // factors of the polynomial T_n, T_0 = 1
  std::array<double, kTerms> previous{};
  for (std::size_t n = 0; n < kTerms; ++n) {
    double weight = 0;
    for (std::size_t j = 0; j < kTerms; ++j) {
      const auto node = static_cast<double>(2 * j + 1);
      const double t = cos_of_turn(node, 4.0 * kTerms);
      weight += power_of_thirds((t + 3) / 4, thirds) *
                cos_of_turn(static_cast<double>(n) * node, 4.0 * kTerms);
    }
    weight *= (n == 0 ? 1.0 : 2.0) / kTerms;
    std::array<double, kTerms> next{};  // T_1 = t T_0, then T_n+1 = 2 t T_n - T_n-1
    for (std::size_t i = 0; i < kTerms; ++i) {
      sum[i] += weight * chebyshev[i];
      next[i] = (i == 0 ? 0 : (n == 0 ? 1 : 2) * chebyshev[i - 1]) - previous[i];
    }
    previous = chebyshev;
    chebyshev = next;
  }
  Series<kTerms> series{};
  for (std::size_t i = 0; i < kTerms; ++i) series[i] = rounded_q31(sum[i]);
  return series;
}

using Series8 = Series<8>;
using Series14 = Series<14>;
using Remainders = std::array<Word32, 2>;

/// The factors by which shifts of 1 and of 2 change the root.
constexpr Remainders make_remainders(int thirds) {
  return {rounded_q31(power_of_thirds(0.5, thirds)), rounded_q31(power_of_thirds(0.25, thirds))};
}

}  // namespace

ORVALIS_HIDDEN_TABLE(Series8, ZOLT_cuberoot_coeffs) = make_series<8>(1);
ORVALIS_HIDDEN_TABLE(Remainders, ZOLT_cuberoot_fraction) = make_remainders(1);
ORVALIS_HIDDEN_TABLE(Series14, ZOLT_root15_fraction) = make_series<14>(2);
ORVALIS_HIDDEN_TABLE(Remainders, ZOLT_root15_coeffs) = make_remainders(2);
// t = 4 * mantissa - 3
ORVALIS_HIDDEN_TABLE(Word32, ZOLT_root15_const1) = 4;
ORVALIS_HIDDEN_TABLE(Word32, ZOLT_root15_const2) = -3;

ORVALIS_EXPORT_TABLE(Series8, ZOLT_cuberoot_coeffs);
ORVALIS_EXPORT_TABLE(Remainders, ZOLT_cuberoot_fraction);
ORVALIS_EXPORT_TABLE(Series14, ZOLT_root15_fraction);
ORVALIS_EXPORT_TABLE(Remainders, ZOLT_root15_coeffs);
ORVALIS_EXPORT_TABLE(Word32, ZOLT_root15_const1);
ORVALIS_EXPORT_TABLE(Word32, ZOLT_root15_const2);

namespace orvalis {
namespace {

constexpr Word64 kOneQ31 = Word64{1} << 31;

/// The root of a mantissa, 2^30..2^31 - 1 in Q31. Every sum on the way is below 1.
template <std::size_t kTerms>
Word64 root_of_mantissa(const Series<kTerms> &series, Word64 mantissa) {
  const Word64 t = orvalis_ZOLT_root15_const1 * mantissa + orvalis_ZOLT_root15_const2 * kOneQ31;
  Word64 sum = 0;
  for (std::size_t i = kTerms; i-- > 0;) sum = ((sum * t + kOneQ31 / 2) >> 31) + series[i];
  return sum;
}

/// root * (factor of a shift by `remainder`) * 2^-whole, rounded half up.
Word32 shifted_root(Word64 root, const Remainders &factors, int remainder, int whole) {
  const Word64 factor = remainder == 0 ? kOneQ31 : factors[static_cast<std::size_t>(remainder) - 1];
  return saturated_word32((root * factor + ((kOneQ31 / 2) << whole)) >> (31 + whole));
}

/// root(|x|) with the sign of x; 0 for 0.
template <class Root>
Word32 odd(Word32 x, Root root) {
  if (x == 0) return 0;
  const Word32 magnitude = L_abs(x);
  const Word16 shift = norm_l(magnitude);
  const Word32 result = root(magnitude << shift, shift);
  return x < 0 ? -result : result;
}

}  // namespace

Word32 cube_root_q31(Word32 x) {
  return odd(x, [](Word32 mantissa, Word32 shift) {
    const int whole = div_l(2 * shift, 3);  // shift / 3
    return shifted_root(root_of_mantissa(orvalis_ZOLT_cuberoot_coeffs, mantissa),
                        orvalis_ZOLT_cuberoot_fraction, shift - 3 * whole, whole);
  });
}

Word32 root15_q31(Word32 x) {
  return odd(x, [](Word32 mantissa, Word32 shift) {
    // A shift by 3 is the factor 2^-2.
    return shifted_root(root_of_mantissa(orvalis_ZOLT_root15_fraction, mantissa),
                        orvalis_ZOLT_root15_coeffs, shift % 3, shift / 3 * 2);
  });
}

}  // namespace orvalis
