// The operators by their definition: values in 64-bit integers, flags in a record.
#pragma once

#include <algorithm>
#include <cstdint>

namespace orvalis::test::definition {

using Wide = std::int64_t;

struct Flags {
  int overflow;
  int carry;
};

// ---- Ranges and bits ----

constexpr Wide max16 = INT16_MAX, min16 = INT16_MIN, max32 = INT32_MAX, min32 = INT32_MIN;

inline Wide low(Wide x) { return static_cast<std::int16_t>(x); }
inline Wide high(Wide x) { return x >> 16; }
inline Wide wrapped(Wide x) { return static_cast<std::int32_t>(x); }
inline Wide clip16(Wide x) { return std::clamp(x, min16, max16); }
inline Wide clip32(Wide x) { return std::clamp(x, min32, max32); }

/// floor(x * 2^n); counts are clamped where any 32-bit value is out of range, or 0 or -1.
inline Wide scaled(Wide x, Wide n) {
  n = std::clamp<Wide>(n, -32, 32);
  return n < 0 ? x >> -n : x * (Wide{1} << n);
}
/// floor(x / 2^n + 1/2) for n > 0.
inline Wide halved_up(Wide x, Wide n) { return (scaled(x, 1 - n) + 1) >> 1; }

inline Wide raise16(Flags &f, Wide x) {
  f.overflow |= x != clip16(x);
  return clip16(x);
}
inline Wide raise32(Flags &f, Wide x) {
  f.overflow |= x != clip32(x);
  return clip32(x);
}

// ---- 16 bits ----

inline Wide sature(Flags &f, Wide x) {
  f.overflow = x != clip16(x);
  return clip16(x);
}
inline Wide abs_s(Flags &, Wide x) { return clip16(x < 0 ? -x : x); }
inline Wide negate(Flags &, Wide x) { return clip16(-x); }
inline Wide extract_h(Flags &, Wide x) { return high(x); }
inline Wide extract_l(Flags &, Wide x) { return low(x); }
inline Wide add(Flags &f, Wide a, Wide b) { return sature(f, a + b); }
inline Wide sub(Flags &f, Wide a, Wide b) { return sature(f, a - b); }
inline Wide mult(Flags &f, Wide a, Wide b) { return sature(f, a * b >> 15); }
inline Wide mult_r(Flags &f, Wide a, Wide b) { return sature(f, (a * b + 0x4000) >> 15); }
inline Wide shl(Flags &f, Wide x, Wide n) { return raise16(f, scaled(x, n)); }
inline Wide shr(Flags &f, Wide x, Wide n) { return shl(f, x, -n); }
inline Wide shr_r(Flags &f, Wide x, Wide n) { return n > 0 ? halved_up(x, n) : shr(f, x, n); }
inline Wide shift_r(Flags &f, Wide x, Wide n) {
  if (n >= 0) return shl(f, x, n);
  if (n < -15) return 0;
  f.overflow = 0;  // the rounding bit is joined by `add`
  return halved_up(x, -n);
}
inline Wide norm(Wide x, Wide lowest) {
  Wide n = 0;
  if (x != 0)
    while (scaled(x, n + 1) >= lowest && scaled(x, n + 1) <= -lowest - 1) ++n;
  return n;
}
inline Wide norm_s(Flags &, Wide x) { return norm(x, min16); }
inline Wide div_s(Flags &f, Wide a, Wide b) {
  if (a <= 0 || a > b) return 0;
  if (a == b) return max16;
  f.overflow = 0;
  return a * 32768 / b;
}

// ---- 32 bits ----

inline Wide L_deposit_h(Flags &, Wide x) { return x * 65536; }
inline Wide L_deposit_l(Flags &, Wide x) { return x; }
inline Wide L_abs(Flags &, Wide x) { return clip32(x < 0 ? -x : x); }
inline Wide L_negate(Flags &, Wide x) { return clip32(-x); }
inline Wide L_add(Flags &f, Wide a, Wide b) { return raise32(f, a + b); }
inline Wide L_sub(Flags &f, Wide a, Wide b) { return raise32(f, a - b); }
inline Wide L_mult(Flags &f, Wide a, Wide b) { return raise32(f, 2 * a * b); }
inline Wide L_mac(Flags &f, Wide s, Wide a, Wide b) { return L_add(f, s, L_mult(f, a, b)); }
inline Wide L_msu(Flags &f, Wide s, Wide a, Wide b) { return L_sub(f, s, L_mult(f, a, b)); }
inline Wide round_BOP(Flags &f, Wide x) { return high(L_add(f, x, 0x8000)); }
inline Wide mac_r(Flags &f, Wide s, Wide a, Wide b) { return round_BOP(f, L_mac(f, s, a, b)); }
inline Wide msu_r(Flags &f, Wide s, Wide a, Wide b) { return round_BOP(f, L_msu(f, s, a, b)); }
inline Wide L_shl(Flags &f, Wide x, Wide n) { return raise32(f, scaled(x, n)); }
inline Wide L_shr(Flags &f, Wide x, Wide n) { return L_shl(f, x, -n); }
inline Wide L_shr_r(Flags &f, Wide x, Wide n) { return n > 0 ? halved_up(x, n) : L_shr(f, x, n); }
inline Wide norm_l(Flags &, Wide x) { return norm(x, min32); }

// ---- Carry ----

inline Wide L_add_c(Flags &f, Wide a, Wide b) {
  const Wide in = f.carry;
  f.overflow = a + b != clip32(a + b) || (in && wrapped(a + b) == max32);
  f.carry = static_cast<int>(((a & 0xFFFFFFFF) + (b & 0xFFFFFFFF) + in) >> 32);
  return wrapped(a + b + in);
}
inline Wide L_sub_c(Flags &f, Wide a, Wide b) {
  if (f.carry) {
    f.carry = 0;
    if (b != min32) return L_add_c(f, a, -b);
    f.overflow |= a > 0;
    return wrapped(a - b);
  }
  const Wide t = wrapped(a - b);
  if (t < 0 && a > 0 && b < 0) {
    f.overflow = 1;
  } else if (t > 0 && a < 0 && b > 0) {
    f = {1, 1};
  } else if (t > 0 && (a ^ b) > 0) {
    f = {0, 1};
  }
  f.overflow |= t == min32;
  return wrapped(a - b - 1);
}
inline Wide L_sat(Flags &f, Wide x) {
  if (!f.overflow) return x;
  const Wide end = f.carry ? min32 : max32;
  f = {0, 0};
  return end;
}
inline Wide L_macNs(Flags &f, Wide s, Wide a, Wide b) { return L_add_c(f, s, L_mult(f, a, b)); }
inline Wide L_msuNs(Flags &f, Wide s, Wide a, Wide b) { return L_sub_c(f, s, L_mult(f, a, b)); }

// ---- Long products and division: no sum but the last can overflow ----

inline Wide upper15(Wide x) { return (x & 0xFFFF) >> 1; }
inline Wide L_mpy_ll(Flags &f, Wide a, Wide b) {
  const Wide cross = high(a) * upper15(b) + high(b) * upper15(a);
  const Wide mid = cross + (2 * upper15(a) * upper15(b) >> 16);
  return L_mac(f, mid >> 14, high(a), high(b));
}
inline Wide L_mpy_ls(Flags &f, Wide a, Wide b) {
  return L_mac(f, 2 * b * upper15(a) >> 15, b, high(a));
}
inline Wide L_divide(Flags &f, Wide a, Wide b) {
  if (a > b || a < 0) return 0;
  const Wide approx = div_s(f, 0x3FFF, high(b));
  const Wide error = L_sub(f, max32, L_mpy_ls(f, b, approx));
  return L_shl(f, L_mpy_ll(f, a, L_mpy_ls(f, error, approx)), 2);
}

// ---- Double precision: `mult` writes the overflow flag, so the order counts ----

inline Wide L_Comp(Flags &f, Wide hi, Wide lo) { return L_mac(f, hi * 65536, lo, 1); }
inline Wide Mpy_32_16(Flags &f, Wide hi, Wide lo, Wide n) {
  const Wide product = L_mult(f, hi, n);
  return L_mac(f, product, mult(f, lo, n), 1);
}
inline Wide Mpy_32(Flags &f, Wide a_hi, Wide a_lo, Wide b_hi, Wide b_lo) {
  const Wide product = L_mult(f, a_hi, b_hi);
  const Wide sum = L_mac(f, product, mult(f, a_hi, b_lo), 1);
  return L_mac(f, sum, mult(f, a_lo, b_hi), 1);
}
inline Wide Div_32(Flags &f, Wide a, Wide b_hi, Wide b_lo) {
  const Wide approx = div_s(f, 0x3FFF, b_hi);
  const Wide error = L_sub(f, max32, Mpy_32_16(f, b_hi, b_lo, approx));
  const Wide inverse = Mpy_32_16(f, high(error), upper15(error), approx);
  const Wide quotient = Mpy_32(f, high(a), upper15(a), high(inverse), upper15(inverse));
  return L_shl(f, quotient, 2);
}

// ---- Complex products ----

template <auto product>
Wide real_part(Flags &f, Wide ar, Wide ai, Wide br, Wide bi) {
  return L_sub(f, product(f, ar, br), product(f, ai, bi));
}
template <auto product>
Wide imag_part(Flags &f, Wide ar, Wide ai, Wide br, Wide bi) {
  return L_add(f, product(f, ar, bi), product(f, ai, br));
}
constexpr auto C2PREAL_SS = real_part<L_mult>, C2PIMAG_SS = imag_part<L_mult>;
constexpr auto C2PREAL_LS = real_part<L_mpy_ls>, C2PIMAG_LS = imag_part<L_mpy_ls>;
template <auto part>
Wide part_of_three(Flags &f, Wide ar, Wide ai, Wide br, Wide bi, Wide cr, Wide ci) {
  const Wide re = real_part<L_mpy_ll>(f, ar, ai, br, bi);
  return part(f, re, imag_part<L_mpy_ll>(f, ar, ai, br, bi), cr, ci);
}
constexpr auto C3PREAL = part_of_three<real_part<L_mpy_ll>>;
constexpr auto C3PIMAG = part_of_three<imag_part<L_mpy_ll>>;

// ---- Logarithm and exponential ----

inline Wide fnLog2(Flags &f, Wide x) {
  if (x == 0) return max32;
  const Wide n = norm_l(f, x), mantissa = high(scaled(x, n));
  const Wide square = mult_r(f, mantissa, mantissa);
  const Wide line = L_mac(f, L_mult(f, square, -11050), mantissa, 32709);
  const Wide fraction = L_add(f, line, -21712 * 65536) >> 3;
  return L_add(f, fraction & 0x03FFFFFF, -(n + 1) * 1024 * 65536);
}
inline Wide fnLog10(Flags &f, Wide x) { return x == 0 ? max32 : L_mpy_ls(f, fnLog2(f, x), 9864); }
inline Wide fnExp2(Flags &f, Wide x) {
  const Wide t = high(x) * 64;
  const Wide shift = -1 - high(t);
  const Wide fraction = ((t & 0xFFFF) - 65536) >> 1;
  const Wide square = mult_r(f, fraction, fraction);
  const Wide line = L_mac(f, L_mult(f, square, 5615), fraction, 21871);
  return scaled(L_add(f, line, 32701 * 65536), -std::max<Wide>(shift, 0));
}
inline Wide fnExp10(Flags &f, Wide x) { return fnExp2(f, L_shl(f, L_mpy_ls(f, x, 27213), 2)); }

}  // namespace orvalis::test::definition
