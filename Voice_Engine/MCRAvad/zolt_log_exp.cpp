#include "Voice_Engine/MCRAvad/zolt_log_exp.h"

#include "Voice_Engine/MCRAvad/wide_arithmetic.h"
#include "Voice_Engine/basic_op/constexpr_math.h"
#include "Voice_Engine/basic_op/zolt_operators.h"

namespace {

using orvalis::Word16;
using orvalis::Word32;
using orvalis::Word64;
using orvalis::constexpr_math::exp2_of;
using orvalis::constexpr_math::exp_of;

using LnCoefficients = std::array<Word16, 5>;
using CoarsePowers = std::array<std::uint32_t, 128>;
using FinePowers = std::array<std::uint32_t, 64>;
using ExpPowers = std::array<Word32, 19>;

constexpr CoarsePowers make_coarse_powers() {
  CoarsePowers table{};
  for (std::size_t i = 0; i < table.size(); ++i) {
    table[i] = static_cast<std::uint32_t>(0x1p30 * exp2_of(static_cast<double>(i) / 128) + 0.5);
  }
  return table;
}

// 1.0 is there twice, so every later entry is one step behind its index: bit-exact results need it.
constexpr FinePowers make_fine_powers() {
  FinePowers table{};
  table[0] = 1u << 30;
  for (std::size_t i = 1; i < table.size(); ++i) {
    table[i] =
        static_cast<std::uint32_t>(0x1p30 * exp2_of(static_cast<double>(i - 1) / 8192) + 0.5);
  }
  return table;
}

/// round(2^18 * e^(sign * 2^(k - 15)))
constexpr ExpPowers make_exp_powers(double sign) {
  ExpPowers table{};
  double exponent = sign * 0x1p-15;
  for (Word32 &entry : table) {
    entry = static_cast<Word32>(0x1p18 * exp_of(exponent) + 0.5);
    exponent *= 2;
  }
  return table;
}

}  // namespace

// Factors of f, f^2 ... f^5 in Q15 that fit ln(1 + f) over f = 0..1 to within 1.6e-5.
ORVALIS_HIDDEN_TABLE(LnCoefficients, ZOLT_ln_coeffs) = {32749, -16106, 9456, -4426, 1040};
ORVALIS_HIDDEN_TABLE(CoarsePowers, ZOLT_LPow2PlusFr1) = make_coarse_powers();
ORVALIS_HIDDEN_TABLE(FinePowers, ZOLT_LPow2PlusFr2) = make_fine_powers();
ORVALIS_HIDDEN_TABLE(ExpPowers, exp_coef_plus) = make_exp_powers(1);
ORVALIS_HIDDEN_TABLE(ExpPowers, exp_coef_minus) = make_exp_powers(-1);

ORVALIS_EXPORT_TABLE(LnCoefficients, ZOLT_ln_coeffs);
ORVALIS_EXPORT_TABLE(CoarsePowers, ZOLT_LPow2PlusFr1);
ORVALIS_EXPORT_TABLE(FinePowers, ZOLT_LPow2PlusFr2);
ORVALIS_EXPORT_TABLE(ExpPowers, exp_coef_plus);
ORVALIS_EXPORT_TABLE(ExpPowers, exp_coef_minus);

// The same powers under a second name.
extern "C" ORVALIS_EXPORT __attribute__((alias("orvalis_ZOLT_LPow2PlusFr1")))
const CoarsePowers LPow2PlusFr1;
extern "C" ORVALIS_EXPORT __attribute__((alias("orvalis_ZOLT_LPow2PlusFr2")))
const FinePowers LPow2PlusFr2;

namespace orvalis {
namespace {

/// ln(x) = exponent * ln(2) + mantissa, for x in Q16.
struct LnParts {
  Word32 exponent;
  Word32 mantissa_q31;
};

LnParts ln_parts(std::uint32_t x) {
  const int leading_zeros = std::countl_zero(x);
  const auto f = static_cast<Word16>(((x << leading_zeros) >> 16) - 0x8000);  // mantissa - 1, Q15
  ZoltFlags unread;  // L_mac of this copy touches none
  Word32 sum = 0;
  Word16 power = f;
  for (const Word16 coefficient : orvalis_ZOLT_ln_coeffs) {
    sum = L_mac(unread, sum, coefficient, power);
    power = static_cast<Word16>((power * f) >> 15);
  }
  return {15 - leading_zeros, sum};
}

/// 2^(position / 2^31) in Q30 for position >= 0.
Word32 pow2_of_fraction(Word32 position, Lookup lookup) {
  constexpr int kCoarseShift = 31 - 7;
  constexpr int kFineShift = 31 - 13;
  const auto up_to = [](std::uint32_t index, std::uint32_t last) {
    return index < last ? index : last;
  };
  const auto bits = static_cast<std::uint32_t>(position);
  if (lookup == Lookup::kOne) {
    const std::uint32_t nearest = (bits + (1u << (kCoarseShift - 1))) >> kCoarseShift;
    return static_cast<Word32>(orvalis_ZOLT_LPow2PlusFr1[up_to(nearest, 127)]);
  }
  const std::uint32_t rest = bits & ((1u << kCoarseShift) - 1);
  const std::uint32_t nearest = (rest + (1u << (kFineShift - 1))) >> kFineShift;
  const Word64 coarse = orvalis_ZOLT_LPow2PlusFr1[bits >> kCoarseShift];
  const Word64 fine = orvalis_ZOLT_LPow2PlusFr2[up_to(nearest, 63)];
  return static_cast<Word32>((coarse * fine + (Word64{1} << 29)) >> 30);
}

}  // namespace

// The sums below reach 16 * ln(2), well inside Q26 and Q27: nothing saturates.

Word32 ln_q26(std::uint32_t x) {
  constexpr Word32 kLn2 = 46518272;  // Q26, 4e-5 too large
  if (x == 0) return MIN_32;
  const LnParts parts = ln_parts(x);
  return parts.exponent * kLn2 + (parts.mantissa_q31 >> 5);
}

Word16 ln_q11(std::uint32_t x) {
  constexpr Word32 kLn2 = 93036544;  // Q27, 4e-5 too large
  if (x == 0) return MIN_16;
  const LnParts parts = ln_parts(x);
  return extract_h(parts.exponent * kLn2 + (parts.mantissa_q31 >> 4));
}

Word32 pow2(Word32 x, Word16 q, Word16 out_q, Lookup lookup) {
  // 31 places to the left and 62 to the right already move all bits of a Word32 out.
  const int places = q < -31 ? -31 : (q > 62 ? 62 : q);
  const Word64 whole = places < 0 ? Word64{x} << -places : Word64{x} >> places;
  if (x < 0 || whole > MAX_16) {
    std::printf("%s:%d :: pow2 Overflow_ZOLT of too small Qx\n", kMathSource, 2027);
    std::exit(-1);
  }
  // The fraction in Q31. What a Q above 31 loses is too small to change the rounding.
  const Word64 fraction = places <= 0 ? 0 : x - (whole << places);
  const auto position =
      static_cast<Word32>(places <= 31 ? fraction << (31 - places) : fraction >> (places - 31));
  const Word64 power = pow2_of_fraction(position, lookup);
  const Word64 right = 30 - out_q - whole;
  if (right < 0) return MAX_32;  // the power is at least 2^30
  if (right == 0) return static_cast<Word32>(power);
  return right > 31 ? 0 : static_cast<Word32>((power + (Word64{1} << (right - 1))) >> right);
}

Word64 exp_q32(Word32 x) {
  constexpr Word64 kLog2OfE = 1549082005;          // Q30
  constexpr Word64 kExpOf21 = 0x4E9B87F67BB3F559;  // Q32
  constexpr Word32 kMax = (21 << 26) - 1;
  constexpr Word32 kQ26Mask = (1 << 26) - 1;
  if (x > kMax) return kExpOf21;
  if (x < -kMax) return 0;
  const auto y = static_cast<Word32>((x * kLog2OfE + (1 << 29)) >> 30);
  const Word64 power = Word64{pow2_of_fraction((y & kQ26Mask) << 5, Lookup::kTwo)} << 2;
  const Word32 whole = y >> 26;  // -31..30, and the power is below 2^33
  return whole < 0 ? power >> -whole : power << whole;
}

Word32 pow_q15(Word32 x, Word32 y) {
  const Word32 base_q16 = saturated_word32(Word64{x} * 2);
  const Word64 log = ln_q26(static_cast<std::uint32_t>(base_q16));
  const Word32 exponent = saturated_word32((log * y + (1 << 30)) >> 31);
  return saturated_word32(exp_q32(exponent) >> 17);
}

}  // namespace orvalis
