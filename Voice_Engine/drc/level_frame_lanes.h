// The levelling of a frame in lanes. What it does: dynamics_control.h.
//
// Of all its flags only those of the last sample stay.
#pragma once

#include "Voice_Engine/basic_op/double_precision.h"
#include "Voice_Engine/basic_op/lanes.h"
#include "Voice_Engine/drc/dynamics_control.h"

namespace orvalis::ORVALIS_BODY {

struct Peak {
  Word16 magnitude;
  Word16 loud_samples;
};

inline Peak find_peak(const Word16 *frame, int samples) {
  using L = Wide;
  constexpr Word16 kLoudMagnitude = 8192;  // a quarter of full scale
  V<L> most = L::broadcast(0);
  Count<L> loud;
  for (int i = 0; i < samples; i += L::kWidth) {
    const V<L> magnitude = abs_s<L>(L::load(frame + i));
    most = L::max(most, magnitude);
    loud.add(L::greater(magnitude, L::broadcast(kLoudMagnitude)));
  }
  return {L::max_lane(most), static_cast<Word16>(loud.total())};
}

/// The gain for a peak, between two entries of the curve; its high half is Q11.
inline Word32 target_gain(const Word16 *curve, Word16 peak) {
  Flags unseen;
  const DoubleWord at = L_Extract(unseen, L_mult(unseen, peak, 63));
  const Word32 upper = L_mult(unseen, at.lo, curve[at.hi + 1]);
  return L_mac(unseen, upper, sub(unseen, MAX_16, at.lo), curve[at.hi]);
}

/// Moves the envelope towards the target sample by sample, and stores its high halves, Q11.
///
/// The step is Mpy_32_16(difference, coefficient), which is even and does not depend on the
/// difference's lowest bit: half of each changes as difference -= (difference * coefficient) >> 15.
/// One coefficient serves the frame: where the difference changes its sign, from positive to 0 or
/// 1, either one gives no step.
inline void move_envelope(DrcInstance &drc, Word32 target, Word16 *gains) {
  const Word32 difference = target - drc.gainEnvelope;  // gains are 0..2^30
  const Word64 coefficient = difference < 1 ? drc.fallCoefficient : drc.riseCoefficient;
  const Word32 end = target - (difference & 1);
  Word32 half = difference >> 1;
  for (int i = 0; i < drc.frameLength; ++i) {
    half -= static_cast<Word32>((half * coefficient) >> 15);
    gains[i] = extract_h(end - 2 * half);
  }
  drc.gainEnvelope = end - 2 * half;
}

inline Word16 level_frame(Flags &flags, DrcInstance &drc, Word16 *frame) {
  using L = Wide;
  const Peak peak = find_peak(frame, drc.frameLength);
  alignas(64) Word16 gains[160];
  move_envelope(drc, target_gain(drc.gainCurve, peak.magnitude), gains);

  const Word16 last_sample = frame[drc.frameLength - 1];
  constexpr Word16 kHalf = 1 << 10;
  for (int i = 0; i < drc.frameLength; i += L::kWidth) {
    const V<L> gain_q11 = L::mult_r(L::broadcast(drc.outputScale), L::load(gains + i));
    const V32<L> product =
        L::dot(L::load(frame + i), L::broadcast(1), L::pairs(gain_q11, L::broadcast(kHalf)));
    L::store(frame + i, L::narrow(L::template shift_right32<11>(product)));
  }
  const Word16 last_gain_q11 = mult_r(flags, drc.outputScale, extract_h(drc.gainEnvelope));
  round_BOP(flags, L_shl(flags, L_mult(flags, last_sample, last_gain_q11), 4));
  return peak.loud_samples;
}

}  // namespace orvalis::ORVALIS_BODY
