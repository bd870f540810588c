#include "Voice_Engine/channel/fixed_fft_kernel.h"

#include <utility>

#include "Voice_Engine/basic_op/operators.h"

namespace orvalis {
namespace {

/// Reorders complex values by their bit-reversed index.
void bit_reverse(Word16 *x, Word32 size) {
  for_each_bit_reversed_pair(static_cast<std::size_t>(size / 2), [x](std::size_t i, std::size_t j) {
    std::swap(x[2 * i], x[2 * j]);
    std::swap(x[2 * i + 1], x[2 * j + 1]);
  });
}

constexpr Word16 saturated(Word32 x) {
  return static_cast<Word16>(x > MAX_16 ? MAX_16 : x < MIN_16 ? MIN_16 : x);
}

/// Rounds a Q30 sum of two products to Q15: what round_BOP(L_mac(L_mult())) gives. A twiddle factor
/// has |c| + |s| < 46342, so the sum stays below 2^31 and only its end can saturate.
constexpr Word16 rounded_q15(Word32 sum_q30) { return saturated((sum_q30 + 0x4000) >> 15); }

/// Radix-2 butterfly with the twiddle factor c + j s; the inverse uses its conjugate. Forward
/// halves its outputs. Returns its last sum before saturation: each butterfly overwrites the
/// overflow flag with that sum's, so only the very last one's is ever seen.
template <Direction kDirection>
inline Word32 butterfly(Word16 *upper, Word16 *lower, Word16 c, Word16 s) {
  constexpr bool kForward = kDirection == Direction::kForward;
  const Word32 across_re = kForward ? -lower[1] * s : lower[1] * s;
  const Word32 across_im = kForward ? lower[0] * s : -lower[0] * s;
  const Word16 re = rounded_q15(lower[0] * c + across_re);
  const Word16 im = rounded_q15(lower[1] * c + across_im);

  constexpr int kHalving = kForward ? 1 : 0;
  const Word32 last_sum = upper[1] + im;
  lower[0] = shift_right(saturated(upper[0] - re), kHalving);
  lower[1] = shift_right(saturated(upper[1] - im), kHalving);
  upper[0] = shift_right(saturated(upper[0] + re), kHalving);
  upper[1] = shift_right(saturated(last_sum), kHalving);
  return last_sum;
}

/// The complex transform. Returns the last sum, unsaturated: the only one that the flag will show.
template <Direction kDirection>
Word32 complex_stages(Word16 *x, const TransformPlan &plan) {
  bit_reverse(x, plan.size);
  Word32 last_sum = 0;
  for (Word32 stage = 0; stage < plan.stages; ++stage) {
    const Word32 half_span = 2 << stage;
    const Word32 twiddle_step = plan.steps[stage];
    for (Word32 k = 0; k < plan.size; k += 2 * half_span) {
      for (Word32 j = 0; j < half_span; j += 2) {
        const Word16 *twiddle = &plan.twiddles[j * twiddle_step];
        last_sum = butterfly<kDirection>(&x[k + j], &x[k + j + half_span], twiddle[0], twiddle[1]);
      }
    }
  }
  return last_sum;
}

inline Word16 rounded_half(Flags &flags, Word32 a, Word32 b) {
  return round_BOP(flags, L_add(flags, a, b) >> 1);
}

/// Turns bins k and N/2 - k of the packed complex spectrum into those of the real one, or back.
template <Direction kDirection>
inline void split_pair(Flags &flags, Word16 *low, Word16 *high, const Word16 *low_twiddle,
                       const Word16 *high_twiddle) {
  constexpr bool kForward = kDirection == Direction::kForward;
  const Word16 even_re = add(flags, low[0], high[0]);
  const Word16 even_im = sub(flags, low[1], high[1]);
  const Word16 odd_sum = add(flags, low[1], high[1]);
  const Word16 odd_difference = sub(flags, high[0], low[0]);
  const Word16 odd_re = kForward ? odd_sum : negate(odd_sum);
  const Word16 odd_im = kForward ? odd_difference : negate(odd_difference);

  // The odd part, rotated by +-k / N of a turn. The sign of the second product follows the
  // direction.
  const auto turned = [&](Word16 along, Word16 across, const Word16 *twiddle, bool plus) {
    const Word32 first = L_mult(flags, along, twiddle[0]);
    const Word32 second = L_mult(flags, across, twiddle[1]);
    return plus == kForward ? L_add(flags, first, second) : L_sub(flags, first, second);
  };
  const Word32 re = L_deposit_h(even_re);
  const Word32 im = L_deposit_h(even_im);
  low[0] = rounded_half(flags, re, turned(odd_re, odd_im, low_twiddle, false));
  low[1] = rounded_half(flags, im, turned(odd_im, odd_re, low_twiddle, true));
  high[0] = rounded_half(flags, re, turned(odd_re, odd_im, high_twiddle, true));
  // `turned` negated would not do: the forward sum saturates after the change of sign.
  const Word32 along = L_mult(flags, odd_im, high_twiddle[0]);
  const Word32 across = L_mult(flags, odd_re, high_twiddle[1]);
  const Word32 mirrored =
      kForward ? L_sub(flags, across, along) : L_negate(L_add(flags, along, across));
  high[1] = rounded_half(flags, L_negate(im), mirrored);
}

template <Direction kDirection>
void split(Flags &flags, Word16 *x, const TransformPlan &plan) {
  constexpr int kHalving = kDirection == Direction::kForward ? 0 : 1;
  const Word16 first = x[0];
  const Word16 second = x[1];
  x[0] = shift_right(add(flags, first, second), kHalving);
  x[1] = shift_right(sub(flags, first, second), kHalving);
  for (Word32 i = 2, j = plan.size - 2; i <= j; i += 2, j -= 2) {
    split_pair<kDirection>(flags, &x[i], &x[j], &plan.twiddles[i], &plan.twiddles[j]);
  }
}

}  // namespace

void complex_fft(Flags &flags, Word16 *x, Direction direction, const TransformPlan &plan) {
  if (direction == Direction::kForward) {
    sature(flags, complex_stages<Direction::kForward>(x, plan));
  } else {
    sature(flags, complex_stages<Direction::kInverse>(x, plan));
  }
}

void real_fft(Flags &flags, Word16 *x, Direction direction, const TransformPlan &plan) {
  if (direction == Direction::kForward) {
    sature(flags, complex_stages<Direction::kForward>(x, plan));
    split<Direction::kForward>(flags, x, plan);
  } else {
    split<Direction::kInverse>(flags, x, plan);
    sature(flags, complex_stages<Direction::kInverse>(x, plan));
  }
}

}  // namespace orvalis
