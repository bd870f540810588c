#include "Voice_Engine/channel/channel_analysis.h"

#include <algorithm>

#include "Voice_Engine/basic_op/block_scaling.h"
#include "Voice_Engine/basic_op/log_exp.h"
#include "Voice_Engine/basic_op/operators.h"

namespace orvalis {
namespace {

/// IS-127's voice metric table: what a channel contributes, by its SNR index.
constexpr Word16 vm_tbl[90] = {
    2,  2,  2,  2,  2,  2,  2,  2,  2,  2,  2,  3,  3,  3,  3,  3,  4,  4,  4,  5,  5,  5,  6,
    6,  7,  7,  7,  8,  8,  9,  9,  10, 10, 11, 12, 12, 13, 13, 14, 15, 15, 16, 17, 17, 18, 19,
    20, 20, 21, 22, 23, 24, 24, 25, 26, 27, 28, 28, 29, 30, 31, 32, 33, 34, 35, 36, 37, 37, 38,
    39, 40, 41, 42, 43, 44, 45, 46, 47, 48, 49, 50, 50, 50, 50, 50, 50, 50, 50, 50, 50};

/// Fills the transform buffer with the previous frame's overlap, this frame pre-emphasised by 0.8,
/// and zeros. Overlap and memory are brought to the scale of the normalised frame. Returns the
/// shift that normalises it.
inline Word16 assemble_frame(Flags &flags, const ChannelPlan &plan, ChannelState &state,
                             const Word16 *frame, Word16 *buffer) {
  constexpr Word16 kHeadroom = 2;
  constexpr Word16 kMinusPreEmphasis = -26214;  // -0.8 in Q15
  Word16 *const x = buffer + plan.overlap;
  Word16 *const end = std::copy_n(frame, plan.frame_samples, x);
  std::fill(end, buffer + plan.transform->size, Word16{0});
  const Word16 shift = block_norm_AL(flags, x, plan.frame_samples, kHeadroom);

  const Word16 rescale = sub(flags, shift, state.prev_shift);
  for (int i = 0; i < plan.overlap; ++i) buffer[i] = shift_r(flags, state.overlap[i], rescale);
  Word16 previous = shift_r(flags, state.pre_emp_mem, rescale);
  for (Word16 *sample = x; sample != end; ++sample) {
    const Word16 emphasised = add(flags, *sample, mult(flags, kMinusPreEmphasis, previous));
    previous = *sample;
    *sample = emphasised;
  }
  std::copy_n(buffer + plan.frame_samples, plan.overlap, state.overlap);
  state.pre_emp_mem = previous;
  state.prev_shift = shift;
  return shift;
}

inline void apply_window(Flags &flags, const ChannelPlan &plan, Word16 *buffer) {
  constexpr Word32 kOne_q15 = 32768;
  Word16 *last = buffer + plan.overlap + plan.frame_samples - 1;
  for (int i = 0; i < plan.overlap; ++i) {
    buffer[i] = mult_r(flags, buffer[i], plan.window_edge[i]);
    last[-i] = mult_r(flags, last[-i], plan.window_edge[i]);
  }
  if (plan.window_flat_q15 == kOne_q15) return;
  const auto flat = static_cast<Word16>(plan.window_flat_q15);
  for (int i = plan.overlap; i < plan.frame_samples; ++i)
    buffer[i] = mult_r(flags, buffer[i], flat);
}

/// A Q15 factor times an energy, normalised first to keep 16 significant bits.
inline Word32 scaled_energy(Flags &flags, Word32 energy, Word16 factor_q15) {
  const Word16 shift = norm_l(energy);
  const Word16 high = extract_h(L_shl(flags, energy, shift));
  return L_shr(flags, L_mult(flags, high, factor_q15), shift);
}

/// The same with a Q31 factor.
inline Word32 scaled_energy(Flags &flags, Word32 energy, Word32 factor_q31) {
  const Word16 shift = norm_l(energy);
  const Word16 high = extract_h(L_shl(flags, energy, shift));
  return L_shr(flags, L_mpy_ls(flags, factor_q31, high), shift);
}

/// Mean power of a channel's bins, in the scale of the normalised frame.
inline Word32 channel_power(Flags &flags, const Word16 *spectrum, ChannelBins bins,
                            ChannelScale scale) {
  Word32 power = 0;
  for (const Word16 *part = &spectrum[2 * bins.first]; part < &spectrum[2 * bins.last + 2];
       ++part) {
    power = L_mac(flags, power, *part, *part);
  }
  return scale.kind == ChannelScale::kShift ? L_shr(flags, power, scale.value)
                                            : scaled_energy(flags, power, scale.value);
}

/// Updates the smoothed channel energies; returns their sum before the floor.
inline Word64 track_energies(Flags &flags, const ChannelPlan &plan, ChannelState &state,
                             const Word16 *spectrum, Word16 shift) {
  constexpr Word32 kAlpha = 0x3999999A;          // 0.45 in Q31
  constexpr Word32 kOneMinusAlpha = 0x46666666;  // 0.55 in Q31
  // A power carries twice the frame's shift, and L_mac has doubled it: 2^7 more makes 1 count 256.
  const Word32 unshift = 7 - 2 * shift;
  Word64 sum = 0;
  for (int i = 0; i < plan.channels; ++i) {
    const Word32 power = channel_power(flags, spectrum, plan.bins[i], plan.scales[i]);
    Word32 &energy = state.energy[i];
    if (state.first_frame) {
      energy = L_shl(flags, power, unshift);
    } else {
      const Word32 present =
          plan.scale_then_smooth
              ? scaled_energy(flags, L_shl(flags, power, unshift), kOneMinusAlpha)
              : L_shl(flags, scaled_energy(flags, power, kOneMinusAlpha), unshift);
      energy = L_add(flags, scaled_energy(flags, energy, kAlpha), present);
    }
    sum += energy;
    if (energy < plan.energy_floor) energy = plan.energy_floor;
  }
  return sum;
}

/// The quantised channel SNR: steps of 3/8 dB, rounded, at least 0.
inline Word16 snr_index(Flags &flags, Word32 energy, Word32 noise) {
  constexpr Word32 kLog10Of2To27 = 545448088;  // Q26: the ratio below is in Q4
  constexpr Word32 kHalfStep = 0x60000;        // 3/16 dB in Q21
  constexpr Word16 kOneTwelfth = 2731;         // Q15: 12 steps of 1/32 dB
  const Word16 energy_shift = norm_l(energy);
  const Word16 noise_shift = norm_l(noise);
  const Word32 quotient =
      L_divide(flags, L_shl(flags, energy, energy_shift - 1), L_shl(flags, noise, noise_shift));
  // The quotient is Q(30 + energy_shift - noise_shift): to Q4 it is 26 more than the difference.
  Word32 ratio_q4 = L_shr(flags, quotient, energy_shift + 26 - noise_shift);
  if (ratio_q4 == 0) ratio_q4 = 1;
  const Word32 logarithm = L_add(flags, fnLog10(flags, ratio_q4), kLog10Of2To27);
  Word32 level = L_mult(flags, kDecibels, extract_h(logarithm));
  if (level < 0) level = 0;
  return extract_h(L_mult(flags, extract_h(L_add(flags, level, kHalfStep)), kOneTwelfth));
}

inline Word16 voice_metric(Flags &flags, const Word16 *snr, int channels) {
  Word16 metric = 0;
  for (int i = 0; i < channels; ++i) {
    metric = add(flags, metric, vm_tbl[snr[i] < 89 ? snr[i] : 89]);
  }
  return metric;
}

inline ChannelFindings analyse_spectrum(Flags &flags, const ChannelPlan &plan, ChannelState &state,
                                        const Word16 *spectrum, Word16 shift) {
  ChannelFindings found;
  found.shift = shift;
  found.unclamped_energy = track_energies(flags, plan, state, spectrum, shift);
  initialise_noise(plan, state);
  for (int i = 0; i < plan.channels; ++i) {
    found.snr[i] = snr_index(flags, state.energy[i], state.noise[i]);
  }
  found.voice_metric = voice_metric(flags, found.snr, plan.channels);
  found.total_energy = sum_energies(flags, state.energy, plan.channels);

  Word16 level[kMaxChannels];
  for (int i = 0; i < plan.channels; ++i) level[i] = level_q5(flags, state.energy[i]);
  if (state.first_frame) {
    for (int i = 0; i < plan.channels; ++i) state.long_term_q5[i] = level[i];
  }
  found.deviation_q5 = 0;
  for (int i = 0; i < plan.channels; ++i) {
    const Word16 distance = abs_s(sub(flags, state.long_term_q5[i], level[i]));
    found.deviation_q5 = add(flags, found.deviation_q5, distance);
  }

  const Word16 alpha = long_term_alpha_q15(flags, plan, found.total_energy);
  const auto one_minus_alpha = static_cast<Word16>(MAX_16 - alpha);
  for (int i = 0; i < plan.channels; ++i) {
    const Word32 past = L_mult(flags, alpha, state.long_term_q5[i]);
    state.long_term_q5[i] = extract_h(L_add(flags, L_mult(flags, one_minus_alpha, level[i]), past));
  }
  found.is_noise = decide_noise(flags, plan, state, found);
  return found;
}

}  // namespace

Word32 log10_energy(Flags &flags, Word32 energy) {
  constexpr Word32 kLog10Of2To23 = 464640964;  // Q26: fnLog10 is relative to 2^31, this to 2^8
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

void initialise_noise(const ChannelPlan &plan, ChannelState &state) {
  constexpr Word32 kMinInitialNoise = 4096;
  if (state.frame_cnt > plan.initial_noise_frames) return;
  for (int i = 0; i < plan.channels; ++i) {
    state.noise[i] = state.energy[i] > kMinInitialNoise ? state.energy[i] : kMinInitialNoise;
  }
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

ChannelFindings analyse_frame(Flags &flags, const ChannelPlan &plan, ChannelState &state,
                              const Word16 *frame, Word16 *spectrum) {
  const Word16 shift = assemble_frame(flags, plan, state, frame, spectrum);
  apply_window(flags, plan, spectrum);
  real_fft(flags, spectrum, Direction::kForward, *plan.transform);
  return analyse_spectrum(flags, plan, state, spectrum, shift);
}

void track_noise(Flags &flags, const ChannelPlan &plan, ChannelState &state) {
  constexpr Word16 kAlpha_q15 = 29490;         // 0.9
  constexpr Word16 kOneMinusAlpha_q15 = 3277;  // 0.1
  for (int i = 0; i < plan.channels; ++i) {
    const Word32 past = scaled_energy(flags, state.noise[i], kAlpha_q15);
    state.noise[i] = L_add(flags, past, scaled_energy(flags, state.energy[i], kOneMinusAlpha_q15));
    if (state.noise[i] < plan.energy_floor) state.noise[i] = plan.energy_floor;
  }
}

}  // namespace orvalis
