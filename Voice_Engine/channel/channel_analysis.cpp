#include "Voice_Engine/channel/channel_analysis.h"

#include "Voice_Engine/basic_op/log_exp.h"
#include "Voice_Engine/basic_op/operators.h"

namespace orvalis {
Word32 log10_energy(Flags &flags, Word32 energy) {
  return L_add(flags, fnLog10(flags, energy), kLog10Of2To23);
}

Word16 level_q5(Flags &flags, Word32 energy) {
  return mult(flags, kDecibels, extract_h(log10_energy(flags, energy)));
}

Word32 sum_energies(Flags &flags, const Word32 *energy, int channels) {
  Word32 sum = 0;
  for (int i = 0; i < channels; ++i) sum = L_add(flags, sum, energy[i]);
  return sum;
}

Word16 long_term_alpha_q15(Flags &flags, const ChannelPlan &plan, Word32 total) {
  // IS-127's alpha falls in a straight line from 0.99 at E_H to 0.5 at 20 dB below. The slope is
  // the same here, but the line begins just below 1, so that alpha reaches 0.999 next to E_H.
  constexpr Word16 kAlphaAtHighLevel_q10 = 1023;
  constexpr Word16 kSlope_q15 = 803;  // 0.0245 a dB: (0.99 - 0.5) / 20
  constexpr Word16 kOne_q10 = 1024;
  constexpr Word16 kHalf_q10 = 510;        // 0.498
  constexpr Word16 kMaxAlpha_q15 = 32440;  // 0.99
  constexpr Word16 kMinAlpha_q15 = 16383;  // 0.5
  const Word16 below_q5 = sub(flags, plan.alpha_high_level_q5, level_q5(flags, total));
  const Word16 fall_q10 = mult(flags, kSlope_q15, shl(flags, below_q5, 5));
  const Word16 alpha_q10 = sub(flags, kAlphaAtHighLevel_q10, fall_q10);
  if (alpha_q10 >= kOne_q10) return kMaxAlpha_q15;
  if (alpha_q10 <= kHalf_q10) return kMinAlpha_q15;
  return shl(flags, alpha_q10, 5);
}

bool decide_noise(Flags &flags, const ChannelPlan &plan, ChannelState &state,
                  const ChannelFindings &found) {
  constexpr Word16 kUpdateCountThreshold = 49;
  constexpr Word16 kHysteresisThreshold = 6;
  bool is_noise = false;
  if (found.voice_metric <= plan.metric_noise) {
    is_noise = true;
    state.update_cnt = 0;
  } else if (found.total_energy > plan.energy_silent && found.deviation_q5 < plan.deviation_voice) {
    state.update_cnt = add(flags, state.update_cnt, 1);
    is_noise = state.update_cnt > kUpdateCountThreshold;
  }

  const Word16 count_before_reset = state.update_cnt;
  if (count_before_reset == state.last_update_cnt) {
    state.hyster_cnt = add(flags, state.hyster_cnt, 1);
    if (state.hyster_cnt > kHysteresisThreshold) state.update_cnt = 0;
  } else {
    state.hyster_cnt = 0;
  }
  state.last_update_cnt = plan.remember_reset ? state.update_cnt : count_before_reset;
  return is_noise;
}

}  // namespace orvalis
