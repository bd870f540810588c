// The fixed-point FFT of both families in lanes. Source: TIA IS-127 (EVRC). Layout and scaling of
// what is exported: fixed_fft.h.
//
// Real and imaginary parts lie apart and in their natural order. The first stages of the radix-2
// decimation in time work on whole vectors, whose twiddle factors are the same in every lane. One
// transposition, which takes its rows in bit-reversed order, turns the vectors' numbers into lanes,
// and makes a pass for bit reversal unnecessary. The last stages find their twiddle factors in
// tables, lane by lane.
#pragma once

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

/// 0..7 with their three bits in reverse.
inline constexpr int kReversedBits[8] = {0, 4, 2, 6, 1, 5, 3, 7};

template <class L>
inline const LaneFactors &factors_of(const TransformPlan &plan) {
  return L::kWidth == 16 ? plan.of_lanes16 : plan.of_lanes8;
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

/// Where the pairs of a stage begin in the tables of twiddle factors.
constexpr int pairs_of_stage(int stage) { return 2 * ((1 << stage) - 1); }

/// A stage whose butterflies combine whole vectors: block by block, each with one twiddle factor.
template <class L, int kVectors, Direction kDirection, int kStage>
inline void vector_stage(const LaneFactors &factors, V<L> *re, V<L> *im) {
  constexpr int kDistance = kVectors >> (kStage + 1);
  for (int block = 0; block < 1 << kStage; ++block) {
    const int at = pairs_of_stage(kStage) + 2 * (kReversedBits[block] >> (3 - kStage));
    const Rotation<L> rotation = {L::broadcast_pair(factors.minus_cos_sin + at),
                                  L::broadcast_pair(factors.sin_cos + at)};
    for (int i = 0; i < kDistance; ++i) {
      const int upper = block * 2 * kDistance + i;
      V<L> &lower_re = re[upper + kDistance];
      V<L> &lower_im = im[upper + kDistance];
      if (block == 0) {
        lower_re = times_32767<L>(lower_re);
        lower_im = times_32767<L>(lower_im);
      } else {
        rotate<L>(lower_re, lower_im, rotation);
      }
      add_and_subtract<L, kDirection>(re[upper], im[upper], lower_re, lower_im);
    }
  }
}

/// A stage whose butterflies combine whole vectors, with a twiddle factor for each lane. Returns
/// what add_and_subtract does of the last one.
template <class L, int kVectors, Direction kDirection, int kStage>
inline V<L> lane_stage(const LaneFactors &factors, V<L> *re, V<L> *im) {
  constexpr int kDistance = (1 << kStage) / L::kWidth;
  V<L> saturated = L::broadcast(0);
  for (int i = 0; i < kDistance; ++i) {
    const int at = pairs_of_stage(kStage) + 2 * i * L::kWidth;
    const Rotation<L> rotation = {L::load_pairs(factors.minus_cos_sin + at),
                                  L::load_pairs(factors.sin_cos + at)};
    for (int upper = i; upper < kVectors; upper += 2 * kDistance) {
      const int lower = upper + kDistance;
      rotate<L>(re[lower], im[lower], rotation);
      saturated = add_and_subtract<L, kDirection>(re[upper], im[upper], re[lower], im[lower]);
    }
  }
  return saturated;
}

/// The stage between them where vectors are as wide as two blocks of eight: that of their halves.
template <class L, int kVectors, Direction kDirection>
inline void half_stage(const LaneFactors &factors, V<L> *re, V<L> *im) {
  for (int v = 0; v < kVectors; v += 2) {
    const Rotation<L> rotation = {L::load_pairs(factors.halves_minus_cos_sin + v * L::kWidth),
                                  L::load_pairs(factors.halves_sin_cos + v * L::kWidth)};
    L::exchange_halves(re[v], re[v + 1]);
    L::exchange_halves(im[v], im[v + 1]);
    rotate<L>(re[v + 1], im[v + 1], rotation);
    add_and_subtract<L, kDirection>(re[v], im[v], re[v + 1], im[v + 1]);
    L::exchange_halves(re[v], re[v + 1]);
    L::exchange_halves(im[v], im[v + 1]);
  }
}

/// Makes lanes of the vectors' numbers, and vectors of the lanes' ones, either in bit-reversed
/// order.
template <class L, int kVectors>
inline void exchange_vectors_and_lanes(V<L> *part) {
  constexpr int kGroups = kVectors / 8;
  for (int group = 0; group < kGroups; ++group) {
    V<L> rows[8];
    for (int v = 0; v < 8; ++v) rows[kReversedBits[v]] = part[v * kGroups + group];
    L::transpose(rows);
    for (int v = 0; v < 8; ++v) part[kReversedBits[v] * kGroups + group] = rows[v];
  }
}

/// The complex transform of kPoints values. The inverse one, which conjugates its factors, is the
/// forward one with real and imaginary parts exchanged, and without its halving. Returns whether
/// the very last sum saturated: every butterfly overwrites the overflow flag with its own.
template <class L, int kPoints, Direction kDirection>
inline bool transform(const TransformPlan &plan, Word16 *first_part, Word16 *second_part) {
  constexpr int kVectors = kPoints / L::kWidth;
  constexpr int kStages = kPoints == 128 ? 7 : 6;
  constexpr bool kForward = kDirection == Direction::kForward;
  Word16 *const real = kForward ? first_part : second_part;
  Word16 *const imag = kForward ? second_part : first_part;

  const LaneFactors &factors = factors_of<L>(plan);
  V<L> re[kVectors];
  V<L> im[kVectors];
  for (int v = 0; v < kVectors; ++v) {
    re[v] = L::load(real + v * L::kWidth);
    im[v] = L::load(imag + v * L::kWidth);
  }
  vector_stage<L, kVectors, kDirection, 0>(factors, re, im);
  vector_stage<L, kVectors, kDirection, 1>(factors, re, im);
  vector_stage<L, kVectors, kDirection, 2>(factors, re, im);
  if constexpr (kVectors == 16) vector_stage<L, kVectors, kDirection, 3>(factors, re, im);
  if constexpr (L::kWidth == 16) half_stage<L, kVectors, kDirection>(factors, re, im);
  exchange_vectors_and_lanes<L, kVectors>(re);
  exchange_vectors_and_lanes<L, kVectors>(im);
  lane_stage<L, kVectors, kDirection, kStages - 3>(factors, re, im);
  lane_stage<L, kVectors, kDirection, kStages - 2>(factors, re, im);
  const V<L> saturated = lane_stage<L, kVectors, kDirection, kStages - 1>(factors, re, im);
  for (int v = 0; v < kVectors; ++v) {
    L::store(real + v * L::kWidth, re[v]);
    L::store(imag + v * L::kWidth, im[v]);
  }
  return L::last(saturated) != 0;
}

/// (even + odd) / 2, rounded to 16 bits, of an even part in Q15 and an odd one in Q30. The odd part
/// saturates before the sum, and the sum before it is rounded. The odd part's low bits can go
/// first: they never carry.
template <class L>
inline V<L> rounded_half(V<L> even, V32<L> odd) {
  const V<L> half = L::average(even, L::narrow(L::template shift_right32<15>(odd)));
  return L::min(L::max(half, L::broadcast(-16384)), L::broadcast(16384));
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
  const SplitFactors &factors =
      factors_of<L>(plan).split[kDirection == Direction::kForward ? 0 : 1];
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
    const V<L> even_re = L::add(low_re, high_re);
    const V<L> even_im = L::sub(low_im, high_im);
    const auto turned = [&](const Word16 *factor) {
      return L::dot(odd_re, odd_im, L::load_pairs(factor + 2 * (k - 1)));
    };
    // -32768 negated saturates in 32 bits, to 32767 and all of its fraction.
    const V<L> least = L::equal(even_im, L::broadcast(MIN_16));
    const V32<L> fraction = L::dot(least, least, L::pairs(L::broadcast(-MAX_16), L::broadcast(0)));
    const V32<L> high_odd_im = L::add32(turned(factors.high_im), fraction);
    L::store(re + k, rounded_half<L>(even_re, turned(factors.low_re)));
    L::store(im + k, rounded_half<L>(even_im, turned(factors.low_im)));
    L::store(re + mirrored, L::reverse(rounded_half<L>(even_re, turned(factors.high_re))));
    L::store(im + mirrored, L::reverse(rounded_half<L>(negate<L>(even_im), high_odd_im)));
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

using Fft = void (*)(Flags &, Word16 *, const TransformPlan &);

/// Of the forward and the inverse transform of either size, the one that is asked for.
inline Fft choose(const Fft (&wide)[2], const Fft (&narrow)[2], Direction direction,
                  const TransformPlan &plan) {
  return (plan.size == 256 ? wide : narrow)[direction == Direction::kForward ? 0 : 1];
}

inline void complex_fft(Flags &flags, Word16 *x, Direction direction, const TransformPlan &plan) {
  constexpr auto kForward = Direction::kForward, kInverse = Direction::kInverse;
  choose({complex_fft_of<Wide, 128, kForward>, complex_fft_of<Wide, 128, kInverse>},
         {complex_fft_of<Lanes8, 64, kForward>, complex_fft_of<Lanes8, 64, kInverse>}, direction,
         plan)(flags, x, plan);
}

inline void real_fft(Flags &flags, Word16 *x, Direction direction, const TransformPlan &plan) {
  constexpr auto kForward = Direction::kForward, kInverse = Direction::kInverse;
  choose({real_fft_of<Wide, 128, kForward>, real_fft_of<Wide, 128, kInverse>},
         {real_fft_of<Lanes8, 64, kForward>, real_fft_of<Lanes8, 64, kInverse>}, direction,
         plan)(flags, x, plan);
}

}  // namespace orvalis::ORVALIS_BODY
