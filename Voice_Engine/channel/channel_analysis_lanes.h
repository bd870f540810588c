// The channel analysis in lanes: 16-bit samples in the widest vectors, channels in lanes of 32
// bits. What it does: channel_analysis.h.
//
// Of all its flags only those of the noise update decision stay: what the long-term levels leave is
// always 0, and every flag before is overwritten.
#pragma once

#include <algorithm>

#include "Voice_Engine/basic_op/lanes.h"
#include "Voice_Engine/basic_op/lanes32.h"
#include "Voice_Engine/channel/channel_analysis.h"
#include "Voice_Engine/channel/fixed_fft_lanes.h"

namespace orvalis::ORVALIS_BODY {

/// IS-127's voice metric table: what a channel contributes, by its SNR index.
constexpr Word16 vm_tbl[90] = {
    2,  2,  2,  2,  2,  2,  2,  2,  2,  2,  2,  3,  3,  3,  3,  3,  4,  4,  4,  5,  5,  5,  6,
    6,  7,  7,  7,  8,  8,  9,  9,  10, 10, 11, 12, 12, 13, 13, 14, 15, 15, 16, 17, 17, 18, 19,
    20, 20, 21, 22, 23, 24, 24, 25, 26, 27, 28, 28, 29, 30, 31, 32, 33, 34, 35, 36, 37, 37, 38,
    39, 40, 41, 42, 43, 44, 45, 46, 47, 48, 49, 50, 50, 50, 50, 50, 50, 50, 50, 50, 50};

// --- From samples to the spectrum ----------------------------------------------------------------

/// Fills `buffer` with the previous frame's overlap, this frame pre-emphasised by 0.8, both
/// windowed, and zeros. Overlap and memory are brought to the scale of the normalised frame.
/// Returns the shift that normalises it.
template <class L, int kSize>
inline Word16 assemble_frame(const ChannelPlan &plan, ChannelState &state, const Word16 *frame,
                             Word16 *buffer) {
  constexpr int kFrame = 5 * kSize / 8;
  constexpr int kOverlap = 3 * kSize / 16;
  constexpr Word16 kHeadroom = 2;
  constexpr Word16 kMinusPreEmphasis = -26214;  // -0.8 in Q15
  const auto shift =
      static_cast<Word16>(orvalis::norm_s(largest_magnitude<L>(frame, kFrame)) - kHeadroom);
  const Word32 rescale = shift - state.prev_shift;

  alignas(64) Word16 normalised[32 + kFrame];
  Word16 *const x = normalised + 32;
  Flags unseen;
  x[-1] = orvalis::shift_r(unseen, state.pre_emp_mem, rescale);
  for (int i = 0; i < kFrame; i += L::kWidth)
    L::store(x + i, normalise<L>(L::load(frame + i), shift));

  for (int i = 0; i < kOverlap; i += L::kWidth)
    L::store(buffer + i, shift_r<L>(L::load(state.overlap + i), rescale));
  for (int i = 0; i < kFrame; i += L::kWidth) {
    const V<L> past = L::mult(L::load(x + i - 1), L::broadcast(kMinusPreEmphasis));
    L::store(buffer + kOverlap + i, L::add(L::load(x + i), past));
  }
  for (int i = 0; i < kOverlap; i += L::kWidth)
    L::store(state.overlap + i, L::load(buffer + kFrame + i));
  state.pre_emp_mem = x[kFrame - 1];
  state.prev_shift = shift;

  const auto apply = [&](int from, int to) {
    for (int i = from; i < to; i += L::kWidth)
      L::store(buffer + i, L::mult_r(L::load(buffer + i), L::load(plan.window + i)));
  };
  apply(0, kOverlap);
  if (!plan.window_is_flat) apply(kOverlap, kFrame);
  apply(kFrame, kFrame + kOverlap);
  for (int i = kFrame + kOverlap; i < kSize; i += L::kWidth) L::store(buffer + i, L::broadcast(0));
  return shift;
}

/// The spectrum of a frame, in the scale of the returned shift.
template <class L, int kSize>
inline Word16 transform_frame(const ChannelPlan &plan, ChannelState &state, const Word16 *frame,
                              SplitBuffer &spectrum) {
  alignas(64) Word16 buffer[kSize];
  const Word16 shift = assemble_frame<L, kSize>(plan, state, frame, buffer);
  deinterleave<L>(buffer, kSize, spectrum);
  Flags unseen;
  real_transform<L, kSize / 2, Direction::kForward>(unseen, *plan.transform, spectrum);
  return shift;
}

/// Twice the power of each channel's bins. Nothing overflows: the powers of all bins add up to
/// sum(x^2) / (N / 4) of the N values that were transformed, of which a frame's are below 1.8 *
/// 8192 and the overlap's, whose window has the energy of 18 of its 48 samples, below 32768. That
/// is less than 2^30.
template <class L, int kSize>
inline void add_powers(const ChannelPlan &plan, const SplitBuffer &spectrum, Word32 *powers) {
  alignas(64) Word32 power[kSize / 2];
  for (int k = 0; k < kSize / 2; k += L::kWidth) {
    const V<L> re = L::load(spectrum.re + k);
    const V<L> im = L::load(spectrum.im + k);
    L::store32(power + k, L::dot(re, im, L::pairs(re, im)));
  }
  alignas(64) Word32 below[kSize / 2 + 1];
  Word32 sum = 0;
  for (int k = 0; k < kSize / 2; k += 8) {
    for (int i = k; i < k + 8; ++i) {
      below[i] = sum;
      sum += power[i];
    }
  }
  below[kSize / 2] = sum;
  for (int i = 0; i < plan.channels; ++i)
    powers[i] = 2 * (below[plan.bins[i].last + 1] - below[plan.bins[i].first]);
}

// --- Channels ------------------------------------------------------------------------------------

/// A value for each channel, and ones beyond the last that fill whole vectors.
struct PerChannel {
  alignas(32) Word32 of[kPaddedChannels];

  PerChannel() { std::ranges::fill(of, 1); }
  PerChannel(const Word32 *values, int channels) : PerChannel() {
    std::copy_n(values, channels, of);
  }

  Words load(int i) const { return load_words(of + i); }
  void store(int i, Words words) { store_words(of + i, words); }
  void copy_to(Word32 *values, int channels) const { std::copy_n(of, channels, values); }
};

/// A Q15 factor times an energy, normalised first to keep 16 significant bits.
inline Words scaled_energy_q15(Words energy, Words factor_q15) {
  const Words shift = norm_l(energy);
  return (2 * ((wrapping_shift_left(energy, shift) >> 16) * factor_q15)) >> shift;
}

/// The same with a Q31 factor.
inline Words scaled_energy_q31(Words energy, Word32 factor_q31) {
  const Words shift = norm_l(energy);
  const Words high = wrapping_shift_left(energy, shift) >> 16;
  return L_mpy_ls(broadcast_words(factor_q31), high) >> shift;
}

/// The smoothed energies with those of this frame, whose powers have the scale of 2^shift.
inline Words smoothed_energy(const ChannelPlan &plan, bool first_frame, Words energy, Words power,
                             Word16 shift) {
  constexpr Word32 kAlpha = 0x3999999A;          // 0.45 in Q31
  constexpr Word32 kOneMinusAlpha = 0x46666666;  // 0.55 in Q31
  // A power carries twice the frame's shift, and is doubled: 2^7 more makes 1 count 256.
  const Words unshift = broadcast_words(7 - 2 * shift);
  if (first_frame) return L_shl(power, unshift);
  const Words present = plan.scale_then_smooth
                            ? scaled_energy_q31(L_shl(power, unshift), kOneMinusAlpha)
                            : L_shl(scaled_energy_q31(power, kOneMinusAlpha), unshift);
  return L_add(scaled_energy_q31(energy, kAlpha), present);
}

/// The quantised channel SNR: steps of 3/8 dB, rounded, at least 0.
inline Words snr_index(Words energy, Words noise) {
  constexpr Word32 kLog10Of2To27 = 545448088;  // Q26: the ratio below is in Q4
  constexpr Word32 kHalfStep = 0x60000;        // 3/16 dB in Q21
  constexpr Word32 kOneTwelfth = 2731;         // Q15: 12 steps of 1/32 dB
  const Words energy_shift = norm_l(energy);
  const Words noise_shift = norm_l(noise);
  const Words quotient = L_divide(wrapping_shift_left(energy, energy_shift) >> 1,
                                  wrapping_shift_left(noise, noise_shift));
  // The quotient is Q(30 + energy_shift - noise_shift): to Q4 it is 26 more than the difference.
  const Words ratio_q4 =
      larger(L_shr(quotient, energy_shift + 26 - noise_shift), broadcast_words(1));
  const Words level = 2 * (((fnLog10(ratio_q4) + kLog10Of2To27) >> 16) * kDecibels);
  return (2 * (((larger(level, Words{}) + kHalfStep) >> 16) * kOneTwelfth)) >> 16;
}

/// Level of an energy above 0 in dB, Q5.
inline Words level_q5(Words energy) {
  return (((fnLog10(energy) + kLog10Of2To23) >> 16) * kDecibels) >> 15;
}

/// Updates energies, noise at the start, long-term levels and counters; `powers` as of add_powers.
inline ChannelFindings analyse_channels(Flags &flags, const ChannelPlan &plan, ChannelState &state,
                                        const PerChannel &powers, Word16 shift) {
  constexpr Word32 kMinInitialNoise = 4096;
  const int channels = plan.channels;
  ChannelFindings found{};
  found.shift = shift;

  PerChannel energy(state.energy, channels);
  for (int i = 0; i < channels; i += kWords) {
    const Words sum = powers.load(i);
    const Words factor = load_words(plan.scales->factor_q15 + i);
    const Words power =
        factor == 0 ? sum >> load_words(plan.scales->shift + i) : scaled_energy_q15(sum, factor);
    energy.store(i, smoothed_energy(plan, state.first_frame, energy.load(i), power, shift));
  }
  for (int i = 0; i < channels; ++i) found.unclamped_energy += energy.of[i];
  for (int i = 0; i < channels; i += kWords)
    energy.store(i, larger(energy.load(i), broadcast_words(plan.energy_floor)));
  energy.copy_to(state.energy, channels);

  PerChannel noise(state.noise, channels);
  if (state.frame_cnt <= plan.initial_noise_frames) {
    for (int i = 0; i < channels; i += kWords)
      noise.store(i, larger(energy.load(i), broadcast_words(kMinInitialNoise)));
    noise.copy_to(state.noise, channels);
  }

  PerChannel snr;
  PerChannel level;
  for (int i = 0; i < channels; i += kWords) {
    snr.store(i, snr_index(energy.load(i), noise.load(i)));
    level.store(i, level_q5(energy.load(i)));
  }
  Word32 metric = 0;
  Word64 total = 0;
  for (int i = 0; i < channels; ++i) {
    found.snr[i] = static_cast<Word16>(snr.of[i]);
    metric += vm_tbl[snr.of[i] < 89 ? snr.of[i] : 89];
    total += energy.of[i];
  }
  found.voice_metric = static_cast<Word16>(metric);  // at most 21 times 50
  found.total_energy = total < MAX_32 ? static_cast<Word32>(total) : MAX_32;

  Flags unseen;
  const Word32 alpha = long_term_alpha_q15(unseen, plan, found.total_energy);
  Word32 deviation = 0;
  for (int i = 0; i < channels; ++i) {
    const Word32 past = state.first_frame ? level.of[i] : state.long_term_q5[i];
    const Word32 distance = past - level.of[i];  // levels are -500..2300
    deviation += distance < 0 ? -distance : distance;
    state.long_term_q5[i] =
        static_cast<Word16>((2 * ((MAX_16 - alpha) * level.of[i] + alpha * past)) >> 16);
  }
  found.deviation_q5 = static_cast<Word16>(deviation < MAX_16 ? deviation : MAX_16);

  flags.overflow = 0;
  found.is_noise = decide_noise(flags, plan, state, found);
  return found;
}

template <class L, int kSize>
inline ChannelFindings analyse_frame_of(Flags &flags, const ChannelPlan &plan, ChannelState &state,
                                        const Word16 *frame, SplitBuffer &spectrum) {
  const Word16 shift = transform_frame<L, kSize>(plan, state, frame, spectrum);
  PerChannel powers;
  add_powers<L, kSize>(plan, spectrum, powers.of);
  return analyse_channels(flags, plan, state, powers, shift);
}

inline ChannelFindings analyse_frame(Flags &flags, const ChannelPlan &plan, ChannelState &state,
                                     const Word16 *frame) {
  SplitBuffer spectrum;
  return plan.transform->size == 256
             ? analyse_frame_of<Wide, 256>(flags, plan, state, frame, spectrum)
             : analyse_frame_of<Lanes8, 128>(flags, plan, state, frame, spectrum);
}

/// No sum of these weights and energies reaches 2^31, and no flag is set.
inline void track_noise(const ChannelPlan &plan, ChannelState &state) {
  constexpr Word32 kAlpha_q15 = 29490;         // 0.9
  constexpr Word32 kOneMinusAlpha_q15 = 3277;  // 0.1
  const PerChannel energy(state.energy, plan.channels);
  PerChannel noise(state.noise, plan.channels);
  for (int i = 0; i < plan.channels; i += kWords) {
    const Words tracked = scaled_energy_q15(noise.load(i), broadcast_words(kAlpha_q15)) +
                          scaled_energy_q15(energy.load(i), broadcast_words(kOneMinusAlpha_q15));
    noise.store(i, larger(tracked, broadcast_words(plan.energy_floor)));
  }
  noise.copy_to(state.noise, plan.channels);
}

}  // namespace orvalis::ORVALIS_BODY
