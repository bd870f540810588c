#include "Voice_Engine/ns/s1chns.h"

#include <algorithm>

#include "Voice_Engine/basic_op/block_scaling.h"
#include "Voice_Engine/basic_op/log_exp.h"
#include "Voice_Engine/channel/channel_plans.h"

namespace orvalis {
namespace {

constexpr int kFrame = 160;
constexpr int kSynthesisOverlap = 96;
constexpr int kBins = 128;
// The inverse transform adds up without scaling; impulses may saturate even so.
constexpr Word16 kSynthesisHeadroom = 4;
constexpr Word16 kDeEmphasis = 26214;  // 0.8 in Q15

/// IS-127's SNR modification: lowers the SNR indices of a frame in which few channels hold speech,
/// so that single channels do not sound as musical noise.
void modify_snr(Word16 *snr, Word16 voice_metric) {
  constexpr Word16 kIndexThreshold = 12;
  constexpr int kIndexCountThreshold = 5;
  constexpr Word16 kMetricThreshold = 56;
  constexpr Word16 kSetbackThreshold = 13;
  const auto index_count = std::count_if(snr, snr + kSuppressionChannels,
                                         [](Word16 index) { return index >= kIndexThreshold; });
  if (index_count >= kIndexCountThreshold) return;
  for (int i = 0; i < kSuppressionChannels; ++i) {
    if (voice_metric < kMetricThreshold || snr[i] < kSetbackThreshold) snr[i] = 1;
  }
}

/// Gain of a channel in Q15: the overall gain in dB, Q21, and 0.454 dB for each step of the SNR
/// index above 6, at most 0 dB.
Word16 channel_gain(Flags &flags, Word16 snr, Word32 base_q21, Word16 slope_q15) {
  constexpr Word16 kMinSnr = 6;
  constexpr Word16 kGainPerStep = 14879;  // 0.454 in Q15: L_mult and L_shl by 5 make it Q21
  const Word16 steps = sub(flags, std::max(snr, kMinSnr), kMinSnr);
  const Word32 rise = L_shl(flags, L_mult(flags, steps, kGainPerStep), 5);
  const Word32 gain_q21 = std::min(L_add(flags, rise, base_q21), Word32{0});
  Word32 exponent_q26 = L_shl(flags, L_mpy_ls(flags, gain_q21, slope_q15), 5);
  if (exponent_q26 == 0) exponent_q26 = -1;  // fnExp10(0) is one half
  return extract_h(fnExp10(flags, exponent_q26));
}

/// The gains of all bins. The overall gain is the reciprocal of the noise, but not below the
/// floor.
void compute_gains(Flags &flags, S1chnsState &ns, ChannelFindings &found) {
  const Word32 noise = sum_energies(flags, ns.ch_noise, kSuppressionChannels);
  const Word32 noise_level = L_negate(log10_energy(flags, noise));
  const Word32 base_q21 = std::max(L_mpy_ls(flags, noise_level, kDecibels), ns.min_gain_q21);
  modify_snr(found.snr, found.voice_metric);
  for (int i = 0; i < kSuppressionChannels; ++i) {
    const Word16 gain = channel_gain(flags, found.snr[i], base_q21, ns.gain_slope_q15);
    const ChannelBins bins = kSuppression.bins[i];
    std::fill(&ns.bin_gain_q15[bins.first], &ns.bin_gain_q15[bins.last + 1], gain);
  }
}

/// Transforms a spectrum back to samples and undoes its block shift.
void synthesise(Flags &flags, Word16 *buffer, Word16 shift) {
  const Word16 spectrum_shift = block_norm_AL(flags, buffer, kMaxTransformSize, kSynthesisHeadroom);
  real_fft(flags, buffer, Direction::kInverse, *kSuppression.transform);
  block_denorm_AL(flags, buffer, kMaxTransformSize, add(flags, shift, spectrum_shift));
}

void overlap_add(Flags &flags, Word16 *buffer, Word16 *tail) {
  for (int i = 0; i < kSynthesisOverlap; ++i) buffer[i] = add(flags, buffer[i], tail[i]);
  std::copy_n(&buffer[kFrame], kSynthesisOverlap, tail);
}

/// Undoes the pre-emphasis. The first product truncates, the others round.
void de_emphasise(Flags &flags, const Word16 *x, Word16 &memory, Word16 *in, Word16 *out) {
  Word16 feedback = mult(flags, kDeEmphasis, memory);
  for (int i = 0; i < kFrame; ++i) {
    if (i > 0) feedback = mult_r(flags, kDeEmphasis, memory);
    memory = add(flags, x[i], feedback);
    in[i] = memory;
    out[i] = memory;
  }
}

}  // namespace

Word32 S1CHNSInit(S1chnsState *state, Word16 mode) {
  S1chnsState &ns = *state;
  ns.frame_cnt = 0;
  ns.first_frame = 1;
  ns.gain_slope_q15 = 1638;
  ns.init_mode = mode;
  ns.min_gain_q21 = mode == 2   ? word32(0xFDB33333)
                    : mode == 3 ? word32(0xFF400000)
                                : word32(0xFE600000);
  ns.pre_emp_mem = 0;
  ns.de_emp_mem = 0;
  ns.update_cnt = 0;
  ns.hyster_cnt = 0;
  ns.last_update_cnt = 0;
  std::ranges::fill(ns.synthesis_overlap, Word16{0});
  std::ranges::fill(ns.bin_gain_q15, Word16{0});
  std::ranges::fill(ns.analysis_overlap, Word16{0});
  std::ranges::fill(ns.ch_enrg, 0);
  ns.prev_shift = 0;
  return 0;
}

void s1chns_C(Flags &flags, S1chnsState *state, Word16 *in, Word16 *out) {
  S1chnsState &ns = *state;
  const ChannelPlan &plan = kSuppression;
  if (ns.frame_cnt != MAX_16) ns.frame_cnt += 1;

  ChannelState channels = channels_of(ns, ns.analysis_overlap, ns.frame_cnt);
  Word16 buffer[kMaxTransformSize];
  ChannelFindings found = analyse_frame(flags, plan, channels, in, buffer);
  compute_gains(flags, ns, found);
  if (found.is_noise) track_noise(flags, plan, channels);

  for (int k = 0; k < kBins; ++k) {
    buffer[2 * k] = mult(flags, buffer[2 * k], ns.bin_gain_q15[k]);
    buffer[2 * k + 1] = mult(flags, buffer[2 * k + 1], ns.bin_gain_q15[k]);
  }
  synthesise(flags, buffer, found.shift);
  overlap_add(flags, buffer, ns.synthesis_overlap);
  de_emphasise(flags, buffer, ns.de_emp_mem, in, out);
  ns.first_frame = 0;
}

}  // namespace orvalis
