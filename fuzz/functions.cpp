// The extended mathematics: any arguments, against the laws that the functions approximate.
#include <algorithm>
#include <cmath>
#include <numeric>

#include "Math_baseop.h"
#include "fuzz/input.h"

namespace {

using orvalis::fuzz::Input;
using orvalis::fuzz::require;

bool is_near(double value, double expected, double tolerance) {
  return std::abs(value - expected) <= tolerance;
}

std::int64_t wide(Input &input) {
  const auto high = static_cast<std::uint64_t>(input.number());
  return static_cast<std::int64_t>(high << 32 | static_cast<std::uint32_t>(input.number()));
}

void check_logarithm(std::uint32_t x) {
  if (x == 0) {
    require(ZOLT_L_log(0) == INT32_MIN && ZOLT_S_log(0) == INT16_MIN, "ln 0 is the least value");
    return;
  }
  require(is_near(std::ldexp(ZOLT_L_log(x), -26), std::log(std::ldexp(x, -16)), 0.0005), "ln");
  require(is_near(std::ldexp(ZOLT_S_log(x), -11), std::log(std::ldexp(x, -16)), 0.001), "short ln");
}

void check_exponential(std::int32_t x) {
  const double power =
      std::ldexp(std::exp(std::clamp(std::ldexp(x, -26), -21.0, 21.0)), 32) * (x > -1409286144);
  const auto is_power = [&](std::int64_t got) {
    return is_near(static_cast<double>(got), power, power * 0.0002 + 1);
  };
  require(is_power(ZOLT_L_exp(x)), "e^x");
  require(is_power(L_exp_plus(x)) && is_power(L_exp_mius(x)), "either half is right everywhere");
}

void check_power_of_two(std::int32_t x, std::int16_t q, std::int16_t out_q, std::uint16_t mode) {
  x = std::max(x, 0);
  const double exponent = std::ldexp(x, -q);
  if (exponent >= 32768 || q <= -32) return;  // ends the process
  const double power = std::exp2(exponent + out_q);
  const std::int32_t got = ZOLT_L_pow2_plus(x, q, out_q, mode);
  if (power > 0x1p31) {
    require(got == INT32_MAX, "2^x saturates");
  } else if (power < 0x1p30) {
    require(is_near(got, power, 0.51 + power * 0.006), "2^x");
  }
}

void check_angles(std::int32_t y, std::int32_t x) {
  require(is_near(std::ldexp(ZOLT_L_sin(x), -31), std::sin(std::ldexp(x, -22)), 0.004), "sine");
  require(is_near(std::ldexp(ZOLT_L_cos(x), -31), std::cos(std::ldexp(x, -22)), 0.004), "cosine");
  if (x >= 0)
    require(is_near(std::ldexp(ZOLT_L_atan(x), -22), std::atan(std::ldexp(x, -11)), 0.0018),
            "arc tangent");
  if (y != 0)
    require(is_near(std::ldexp(ZOLT_L_atan2(y, x), -22), std::atan2(y, x), 0.0019), "angle");
}

void check_roots(std::int32_t x) {
  const double value = std::ldexp(x, -31);
  require(is_near(ZOLT_L_cuberoot(x), std::ldexp(std::cbrt(value), 31), 64), "cube root");
  if (x >= 0)
    require(is_near(ZOLT_L_root15(x), std::ldexp(std::pow(value, 2.0 / 3), 31), 5), "x^(2/3)");
}

void check_wide(std::int64_t a, std::int64_t b) {
  require(ZOLT_L64_abs(a) >= 0, "no absolute value is negative");
  if (a >= 0)
    require(is_near(ZOLT_L64_sqrt_Q0(a), std::min(std::sqrt(static_cast<double>(a)), 0x1p31), 1),
            "square root");
  if (b != 0) ZOLT_L64_div(a, b);
  const auto low = static_cast<std::int32_t>(b);
  const double product = static_cast<double>(a) * low;
  require(is_near(static_cast<double>(ZOLT_LL_mult_64a32(a, low)), std::ldexp(product, -32),
                  1 + std::ldexp(std::abs(product), -82)),
          "a * b / 2^32");
  ZOLT_L64_mult(a, b);
  const auto high = static_cast<std::int32_t>(a >> 32);
  if (low != 0 && high != INT32_MIN && low != INT32_MIN)
    require(ZOLT_get_gcd(high, low) == std::gcd(high, low), "greatest common divisor");
  std::int64_t coefficients[9];
  for (int i = 0; i < 9; ++i) coefficients[i] = a >> i;
  ZOLT_POLYVALFix(coefficients, low, 9);
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t *bytes, std::size_t size) {
  Input input(bytes, size);
  while (!input.is_empty()) {
    const std::uint8_t choice = input.byte();
    const std::int32_t x = input.number();
    switch (choice % 8) {
      case 0:
        check_logarithm(static_cast<std::uint32_t>(x));
        break;
      case 1:
        check_exponential(x);
        break;
      case 2: {
        const std::int16_t q = input.word(), out_q = input.word();
        check_power_of_two(x, q, out_q, input.byte());
        break;
      }
      case 3:
        require(ZOLT_expintFix(x) == ZOLT_expintFix(-std::max(x, -INT32_MAX)) || x < -INT32_MAX,
                "E1 takes the absolute value");
        break;
      case 4:
        check_angles(x, input.number());
        break;
      case 5:
        check_roots(x);
        break;
      case 6:
        ZOLT_L_pow(x, input.number());
        break;
      default:
        check_wide(static_cast<std::int64_t>(static_cast<std::uint64_t>(x) << 32 |
                                             static_cast<std::uint32_t>(input.number())),
                   wide(input));
    }
  }
  return 0;
}
