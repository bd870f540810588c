// The fixed-point FFT of both families in lanes. Source: TIA IS-127 (EVRC). Layout and scaling of
// what is exported: fixed_fft.h.
//
// Real and imaginary parts lie apart and in their natural order. The first stages of the radix-2
// decimation in time work on whole vectors, whose twiddle factors are the same in every lane. One
// transposition, which takes its rows in bit-reversed order, turns the vectors' numbers into lanes,
// and makes a pass for bit reversal unnecessary. The last stages find their twiddle factors in
// tables, lane by lane.
#pragma once

#include <initializer_list>

#include "Voice_Engine/basic_op/lanes.h"
#include "Voice_Engine/basic_op/operators.h"
#include "Voice_Engine/channel/fixed_fft_kernel.h"

namespace orvalis::ORVALIS_BODY {

/// A transform's values, even ones and odd ones apart: parts of complex values, or samples.
/// A real spectrum has bin 0 and the Nyquist bin at the front, as re[0] and im[0].
struct SplitBuffer {
  alignas(64) Word16 re[128];
  alignas(64) Word16 im[128];
};

constexpr int reversed_bits(int x, int bits) {
  int reversed = 0;
  for (int i = 0; i < bits; ++i) reversed |= ((x >> i) & 1) << (bits - 1 - i);
  return reversed;
}

/// A twiddle factor c + j s: dot products with a complex value's parts are the parts of the
/// product, the real one negated (-32768 occurs as s, and has no negative).
template <class L>
struct Rotation {
  Pairs<L> minus_cos_sin;
  Pairs<L> sin_cos;
};

/// (re, im) times the rotation, in Q15, rounded and saturated. A twiddle factor has |c| + |s| <
/// 46342, so no sum reaches 2^31.
template <class L>
inline void rotate(V<L> &re, V<L> &im, const Rotation<L> &by) {
  const V32<L> half = L::broadcast32(0x4000);
  const V32<L> real = L::sub32(half, L::dot(re, im, by.minus_cos_sin));
  const V32<L> imag = L::add32(half, L::dot(re, im, by.sin_cos));
  re = L::narrow(L::template shift_right32<15>(real));
  im = L::narrow(L::template shift_right32<15>(imag));
}

/// The first twiddle factor is 32767, not 1: its rounded product is 1 closer to zero from 16384 on
/// (from -16384 on below).
template <class L>
inline V<L> times_32767(V<L> x) {
  const V<L> large = L::greater(x, L::broadcast(16384));
  const V<L> small = L::greater(L::broadcast(-16383), x);
  return L::wrapping_sub(L::wrapping_add(x, large), small);
}

/// Upper plus and minus lower, halved if forward. Every lane of the result is zero where the last
/// sum, of the imaginary parts, did not saturate.
template <class L, Direction kDirection>
inline V<L> add_and_subtract(V<L> &upper_re, V<L> &upper_im, V<L> &lower_re, V<L> &lower_im) {
  constexpr int kHalving = kDirection == Direction::kForward ? 1 : 0;
  const V<L> last_re = L::add(upper_re, lower_re);
  const V<L> last_im = L::add(upper_im, lower_im);
  // The inverse transform runs with real and imaginary parts exchanged.
  const V<L> saturated = kDirection == Direction::kForward
                             ? L::bit_xor(last_im, L::wrapping_add(upper_im, lower_im))
                             : L::bit_xor(last_re, L::wrapping_add(upper_re, lower_re));
  lower_re = L::shift_right(L::sub(upper_re, lower_re), kHalving);
  lower_im = L::shift_right(L::sub(upper_im, lower_im), kHalving);
  upper_re = L::shift_right(last_re, kHalving);
  upper_im = L::shift_right(last_im, kHalving);
  return saturated;
}

/// The complex transform of kPoints values. The inverse one, which conjugates its factors, is the
/// forward one with real and imaginary parts exchanged, and without its halving. Returns whether
/// the very last sum saturated: every butterfly overwrites the overflow flag with its own.
template <class L, int kPoints, Direction kDirection>
inline bool transform(const TransformPlan &plan, Word16 *first_part, Word16 *second_part) {
  constexpr int kVectors = kPoints / L::kWidth;
  constexpr int kStages = kPoints == 128 ? 7 : 6;
  constexpr int kRowBits = kStages - 3;  // of a value's number, above those of a block of eight
  constexpr int kVectorStages = L::kWidth == 16 ? kRowBits - 1 : kRowBits;
  constexpr bool kForward = kDirection == Direction::kForward;
  Word16 *const real = kForward ? first_part : second_part;
  Word16 *const imag = kForward ? second_part : first_part;

  V<L> re[kVectors];
  V<L> im[kVectors];
  for (int v = 0; v < kVectors; ++v) {
    re[v] = L::load(real + v * L::kWidth);
    im[v] = L::load(imag + v * L::kWidth);
  }

  for (int stage = 0; stage < kVectorStages; ++stage) {
    const int distance = kVectors >> (stage + 1);
    for (int block = 0; block < 1 << stage; ++block) {
      const int upper = block * 2 * distance;
      const Word16 *factor = plan.twiddles + reversed_bits(block, stage) * 2 * (kPoints >> stage);
      const Rotation<L> rotation = {broadcast_pairs<L>(static_cast<Word16>(-factor[0]), factor[1]),
                                    broadcast_pairs<L>(factor[1], factor[0])};
      for (int v = upper; v < upper + distance; ++v) {
        V<L> &lower_re = re[v + distance];
        V<L> &lower_im = im[v + distance];
        if (block == 0) {
          lower_re = times_32767<L>(lower_re);
          lower_im = times_32767<L>(lower_im);
        } else {
          rotate<L>(lower_re, lower_im, rotation);
        }
        add_and_subtract<L, kDirection>(re[v], im[v], lower_re, lower_im);
      }
    }
  }

  if constexpr (L::kWidth == 16) {  // the next stage is that of the halves of each vector
    for (int v = 0; v < kVectors; v += 2) {
      const Rotation<L> rotation = {L::load_pairs(plan.halves_minus_cos_sin + v * L::kWidth),
                                    L::load_pairs(plan.halves_sin_cos + v * L::kWidth)};
      L::exchange_halves(re[v], re[v + 1]);
      L::exchange_halves(im[v], im[v + 1]);
      rotate<L>(re[v + 1], im[v + 1], rotation);
      add_and_subtract<L, kDirection>(re[v], im[v], re[v + 1], im[v + 1]);
      L::exchange_halves(re[v], re[v + 1]);
      L::exchange_halves(im[v], im[v + 1]);
    }
  }

  constexpr int kGroups = kVectors / 8;
  for (int group = 0; group < kGroups; ++group) {
    for (V<L> *part : {re, im}) {
      V<L> rows[8];
      for (int v = 0; v < 8; ++v) rows[reversed_bits(v, 3)] = part[v * kGroups + group];
      L::transpose(rows);
      for (int v = 0; v < 8; ++v) part[reversed_bits(v, 3) * kGroups + group] = rows[v];
    }
  }

  V<L> saturated = L::broadcast(0);
  for (int stage = kStages - 3; stage < kStages; ++stage) {
    const int distance = (1 << stage) / L::kWidth;
    const int table = 2 * ((1 << stage) - 8);
    for (int block = 0; block < kVectors; block += 2 * distance) {
      for (int v = 0; v < distance; ++v) {
        const int at = table + 2 * v * L::kWidth;
        const Rotation<L> rotation = {L::load_pairs(plan.minus_cos_sin + at),
                                      L::load_pairs(plan.sin_cos + at)};
        const int upper = block + v;
        const int lower = upper + distance;
        rotate<L>(re[lower], im[lower], rotation);
        saturated = add_and_subtract<L, kDirection>(re[upper], im[upper], re[lower], im[lower]);
      }
    }
  }

  for (int v = 0; v < kVectors; ++v) {
    L::store(real + v * L::kWidth, re[v]);
    L::store(imag + v * L::kWidth, im[v]);
  }
  return L::last(saturated) != 0;
}

/// (even + odd) / 2 rounded to 16 bits, from Q15 parts: the odd one saturates before the sum, the
/// sum before it is rounded.
template <class L>
inline V<L> rounded_half(V32<L> even, V32<L> odd) {
  constexpr Word32 kMaxHalf = (1 << 30) - 1;
  odd = L::min32(L::max32(odd, L::broadcast32(-kMaxHalf - 1)), L::broadcast32(kMaxHalf));
  const V32<L> sum = L::min32(L::add32(even, odd), L::broadcast32(kMaxHalf));
  const V32<L> rounded = L::add32(sum, L::broadcast32(0x8000));
  return L::max(L::narrow(L::template shift_right32<16>(rounded)), L::broadcast(-16384));
}

/// The middle bin, which is its own mirror and turns by a quarter. Operator by operator: it comes
/// last, and of a forward transform its flags are the ones that stay.
template <Direction kDirection>
inline void split_middle(Flags &flags, Word16 &re, Word16 &im, Word16 sine) {
  constexpr bool kForward = kDirection == Direction::kForward;
  const Word16 even = orvalis::add(flags, re, re);
  const Word16 sum = orvalis::add(flags, im, im);
  const Word32 odd = L_mult(flags, kForward ? sum : orvalis::negate(sum), sine);
  flags.overflow = kForward && odd == MAX_32;
  re = round_BOP(flags, L_deposit_h(even) >> 1);
  im = round_BOP(flags, (kForward ? odd : L_negate(odd)) >> 1);
}

/// Turns the packed complex spectrum of a real signal into its spectrum, or back.
template <class L, int kPoints, Direction kDirection>
inline void split(Flags &flags, const TransformPlan &plan, Word16 *re, Word16 *im) {
  constexpr int kHalving = kDirection == Direction::kForward ? 0 : 1;
  constexpr int kMiddle = kPoints / 2;
  const SplitFactors &factors = plan.split[kDirection == Direction::kForward ? 0 : 1];
  Flags unseen;
  const Word16 first = re[0];
  const Word16 second = im[0];
  re[0] = orvalis::shift_right(orvalis::add(unseen, first, second), kHalving);
  im[0] = orvalis::shift_right(orvalis::sub(unseen, first, second), kHalving);
  Word16 middle_re = re[kMiddle];
  Word16 middle_im = im[kMiddle];
  split_middle<kDirection>(flags, middle_re, middle_im, plan.twiddles[kPoints + 1]);

  for (int k = 1; k < kMiddle; k += L::kWidth) {
    const int mirrored = kPoints - k - (L::kWidth - 1);
    const V<L> low_re = L::load(re + k);
    const V<L> low_im = L::load(im + k);
    const V<L> high_re = L::reverse(L::load(re + mirrored));
    const V<L> high_im = L::reverse(L::load(im + mirrored));
    V<L> odd_re = L::add(low_im, high_im);
    V<L> odd_im = L::sub(high_re, low_re);
    if constexpr (kDirection == Direction::kInverse) {
      odd_re = negate<L>(odd_re);
      odd_im = negate<L>(odd_im);
    }
    const V32<L> even_re = L::widen_q15(L::add(low_re, high_re));
    const V32<L> even_im = L::widen_q15(L::sub(low_im, high_im));
    // -32768 negated saturates.
    const V32<L> minus_even_im =
        L::min32(L::sub32(L::broadcast32(0), even_im), L::broadcast32((1 << 30) - 1));
    const auto turned = [&](const Word16 *factor) {
      return L::dot(odd_re, odd_im, L::load_pairs(factor + 2 * (k - 1)));
    };
    L::store(re + k, rounded_half<L>(even_re, turned(factors.low_re)));
    L::store(im + k, rounded_half<L>(even_im, turned(factors.low_im)));
    L::store(re + mirrored, L::reverse(rounded_half<L>(even_re, turned(factors.high_re))));
    L::store(im + mirrored, L::reverse(rounded_half<L>(minus_even_im, turned(factors.high_im))));
  }
  re[kMiddle] = middle_re;
  im[kMiddle] = middle_im;
}

/// The real transform of 2 kPoints samples, in place.
template <class L, int kPoints, Direction kDirection>
inline void real_transform(Flags &flags, const TransformPlan &plan, SplitBuffer &x) {
  if constexpr (kDirection == Direction::kForward) {
    transform<L, kPoints, kDirection>(plan, x.re, x.im);
    split<L, kPoints, kDirection>(flags, plan, x.re, x.im);
  } else {
    split<L, kPoints, kDirection>(flags, plan, x.re, x.im);
    flags.overflow = transform<L, kPoints, kDirection>(plan, x.re, x.im);
  }
}

template <class L>
inline void deinterleave(const Word16 *x, int size, SplitBuffer &parts) {
  for (int i = 0; i < size / 2; i += L::kWidth) {
    V<L> even;
    V<L> odd;
    L::load_deinterleaved(x + 2 * i, even, odd);
    L::store(parts.re + i, even);
    L::store(parts.im + i, odd);
  }
}

template <class L>
inline void interleave(const SplitBuffer &parts, int size, Word16 *x) {
  for (int i = 0; i < size / 2; i += L::kWidth)
    L::store_interleaved(x + 2 * i, L::load(parts.re + i), L::load(parts.im + i));
}

template <class L, int kPoints, Direction kDirection>
void complex_fft_of(Flags &flags, Word16 *x, const TransformPlan &plan) {
  SplitBuffer parts;
  deinterleave<L>(x, 2 * kPoints, parts);
  flags.overflow = transform<L, kPoints, kDirection>(plan, parts.re, parts.im);
  interleave<L>(parts, 2 * kPoints, x);
}

template <class L, int kPoints, Direction kDirection>
void real_fft_of(Flags &flags, Word16 *x, const TransformPlan &plan) {
  SplitBuffer parts;
  deinterleave<L>(x, 2 * kPoints, parts);
  real_transform<L, kPoints, kDirection>(flags, plan, parts);
  interleave<L>(parts, 2 * kPoints, x);
}

inline void complex_fft(Flags &flags, Word16 *x, Direction direction, const TransformPlan &plan) {
  constexpr auto kForward = Direction::kForward;
  constexpr auto kInverse = Direction::kInverse;
  if (plan.size == 256) {
    (direction == kForward ? complex_fft_of<Wide, 128, kForward>
                           : complex_fft_of<Wide, 128, kInverse>)(flags, x, plan);
  } else {
    (direction == kForward ? complex_fft_of<Lanes8, 64, kForward>
                           : complex_fft_of<Lanes8, 64, kInverse>)(flags, x, plan);
  }
}

inline void real_fft(Flags &flags, Word16 *x, Direction direction, const TransformPlan &plan) {
  constexpr auto kForward = Direction::kForward;
  constexpr auto kInverse = Direction::kInverse;
  if (plan.size == 256) {
    (direction == kForward ? real_fft_of<Wide, 128, kForward>
                           : real_fft_of<Wide, 128, kInverse>)(flags, x, plan);
  } else {
    (direction == kForward ? real_fft_of<Lanes8, 64, kForward>
                           : real_fft_of<Lanes8, 64, kInverse>)(flags, x, plan);
  }
}

}  // namespace orvalis::ORVALIS_BODY
