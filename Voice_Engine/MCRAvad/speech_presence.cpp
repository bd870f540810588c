#include "Voice_Engine/MCRAvad/speech_presence.h"

#include <algorithm>

#include "Voice_Engine/MCRAvad/exponential_integral.h"
#include "Voice_Engine/MCRAvad/noise_spectrum.h"
#include "Voice_Engine/MCRAvad/rounding.h"
#include "Voice_Engine/MCRAvad/windows.h"
#include "Voice_Engine/MCRAvad/zolt_log_exp.h"

namespace orvalis {
namespace {

constexpr Word64 kOne_q12 = 4096;
constexpr Word32 kMostAbsence_q31 = 2040109466;  // 0.95: speech may set in at any time

// ---- SNR of a bin ------------------------------------------------------------------------------

Word32 posterior_snr_q10(Word64 power, Word64 noise) {
  return saturated_word32(noise < 2 ? power : L64_quotient<10>(power, noise));
}

/// 0.08 of what the frame itself says, never 0.
Word64 instantaneous_snr_q12(Word32 posterior_q10) {
  constexpr Word64 kShare_q31 = 171798692;  // 0.08
  constexpr Word64 kOne_q10 = 1024;
  if (posterior_q10 <= 1026) return 1;
  return rounded_shift_right((posterior_q10 - kOne_q10) * kShare_q31, 29);
}

/// 0.92 of what the previous frame's gain left. Gains are below 2^21, for the exponential integral
/// gives at most e^3.9; so the last product stays below 2^60.
Word64 carried_snr_q12(Word64 gain_q15, Word32 posterior_q10) {
  constexpr Word64 kTwice_q30 = 1975684956;  // 1.84
  const Word64 scaled = rounded_shift_right(gain_q15 * kTwice_q30, 30);
  return rounded_shift_right(gain_q15 * rounded_shift_right(scaled * posterior_q10, 14), 15);
}

/// posterior * prior / (1 + prior) in Q12.
Word32 snr_product_q12(Word32 posterior_q10, Word32 prior_q12) {
  const Word64 product = L64_shl(Word64{posterior_q10} * prior_q12, 3);
  return saturated_word32(rounded_half(product / (prior_q12 + kOne_q12)));
}

/// Gain of the log-spectral amplitude: prior / (1 + prior) * e^(E1(v) / 2).
Word32 amplitude_gain_q15(Word32 v_q12, Word32 prior_q12, bool is_first) {
  if (prior_q12 == 0) return 0;
  constexpr Word64 kMost_q32 = Word64{20} << 32;
  const Word64 half = std::clamp(rounded_half(expint_q32(v_q12)), -kMost_q32, kMost_q32);
  const Word64 half_q26 = is_first ? half >> 6 : rounded_shift_right(half, 6);
  const Word64 raised = saturated_product(exp_q32(static_cast<Word32>(half_q26)), prior_q12);
  return saturated_word32(rounded_shift_right(raised, 17) / (prior_q12 + kOne_q12));
}

// ---- SNR of surroundings -----------------------------------------------------------------------

Word32 averaged_snr_q12(Word32 average_q12, Word32 prior_q12) {
  constexpr Word32 kKept_q31 = 1503238554;  // 0.7
  constexpr Word32 kTaken_q31 = 644245094;  // 0.3
  return saturated_sum(mult_q31(average_q12, kKept_q31), mult_q31(prior_q12, kTaken_q31));
}

/// Five times the weighted mean of a bin and 20 neighbours on either side. Where there are fewer,
/// the weights still begin with the first one's.
Word32 global_snr_q12(const Word32 *average_q12, int bin) {
  constexpr int kReach = 20;
  const int first = std::max(bin - kReach, 0);
  const int last = std::min(bin + kReach, kMcraBins - 1);
  Word64 sum = 0;
  for (int k = first; k <= last; ++k)
    sum += weighted(average_q12[k], orvalis_ZOLT_vadHamTable3[static_cast<std::size_t>(k - first)]);
  return saturated_word32(rounded_shift_right(sum, 2));
}

/// Mean of the lower third of the spectrum, where voices are.
Word32 frame_snr_q12(const Word32 *average_q12) {
  constexpr int kLowBins = 41;
  Word64 sum = 0;
  for (int k = 0; k < kLowBins; ++k) sum += average_q12[k];
  return saturated_word32(rounded_shift_right(sum * 32 / kLowBins, 5));
}

/// From 0 at `low` to 1 at `high`, linear in the logarithm of the SNR between them.
struct LogRamp {
  Word32 low_q12;
  Word32 high_q12;
  Word64 offset_q26;  // 4 ln 2, for logarithms take Q12 for Q16, less ln low

  Word32 operator()(Word32 snr_q12) const {
    constexpr Word64 kSpan_q29 = 1483429151;  // ln(high / low)
    if (snr_q12 < low_q12) return 0;
    if (snr_q12 >= high_q12) return MAX_32;
    const Word64 above_q26 = ln_q26(static_cast<std::uint32_t>(snr_q12)) + offset_q26;
    return saturated_word32(above_q26 * (1 << 28) / kSpan_q29 * 64);
  }
};

constexpr LogRamp kLocalLikelihood{8174, 129527, 139708119};  // 3 dB to 15 dB
constexpr LogRamp kGlobalLikelihood{2044, 32382, 232740758};  // -3 dB to 9 dB
constexpr Word32 kFrameLikelihood_q12 = 8174;                 // 3 dB

/// How likely it is that a bin holds no speech, by what surrounds it.
Word32 absence_prior_q31(Word32 frame_q31, Word32 local_q31, Word32 global_q31) {
  const Word32 presence = mult_q31(mult_q31(frame_q31, local_q31), global_q31);
  return std::min(MAX_32 - presence, kMostAbsence_q31);
}

// ---- Probability of speech ---------------------------------------------------------------------

/// e^-v in Q32, with v limited to 20.
Word64 decay_q32(Word32 v_q12) {
  constexpr Word32 kMost_q12 = 20 * 4096;
  return exp_q32(-std::clamp(v_q12, -kMost_q12, kMost_q12) * (1 << 14));
}

/// What is below 0.051 counts as nothing.
Word32 cut(Word64 probability_q31, Word32 most_that_is_nothing) {
  return probability_q31 <= most_that_is_nothing ? 0 : saturated_word32(probability_q31);
}

/// 18 / (2 + 19 (1 + prior) e^-v), at most 1: without a history absence counts as 0.95 likely.
Word32 first_probability_q31(Word32 v_q12, Word32 prior_q12) {
  constexpr Word64 kEighteen_q38 = 4947802324992;
  constexpr Word64 kTwo_q6 = 128;
  const Word32 scaled = mult_q31(saturated_word32(prior_q12 + kOne_q12), kMostAbsence_q31);
  // The first frame's prior SNR is below 2^30, so the product stays below 2^62.
  const Word64 odds_q6 = (20 * ((decay_q32(v_q12) * scaled) >> 6)) >> 32;
  return cut(rounded_half(kEighteen_q38 / (odds_q6 + kTwo_q6)), 109521666);
}

/// 1 / (1 + q / (1 - q) (1 + prior) e^-v), with q the prior probability of absence.
Word32 probability_q31(Word32 v_q12, Word32 prior_q12, Word32 absence_q31) {
  constexpr Word64 kOne_q16 = 65536;
  const Word64 decay = decay_q32(v_q12);
  const Word32 scaled = mult_q31(saturated_word32(prior_q12 + kOne_q12), absence_q31);
  if (scaled == 0 || decay == 0) return MAX_32;
  // Absence is at most 0.95 likely, so the quotient is below 2^37. Odds beyond 32 bits give less
  // than the cut leaves.
  const Word64 odds_q16 = 4 * (L64_shl(decay * scaled, 1) / (MAX_32 - absence_q31));
  return cut((Word64{1} << 62) / (odds_q16 + kOne_q16) >> 15, 109521665);
}

/// SNR of the surroundings, from the previous frame's SNRs.
void update_surroundings(VADINFO &vad) {
  for (int k = 0; k < kMcraBins; ++k)
    vad.prioriSnrAvg[k] = averaged_snr_q12(vad.prioriSnrAvg[k], vad.prioriSnr[k]);
  vad.frameSnr = frame_snr_q12(vad.prioriSnrAvg);
}

Word32 absence_of_bin_q31(const VADINFO &vad, int bin) {
  const Word32 frame = vad.frameSnr >= kFrameLikelihood_q12 ? MAX_32 : 0;
  return absence_prior_q31(frame, kLocalLikelihood(vad.prioriSnrAvg[bin]),
                           kGlobalLikelihood(global_snr_q12(vad.prioriSnrAvg, bin)));
}

}  // namespace

void update_presence(VADINFO &vad) {
  const bool is_first = vad.frameIndex == 0;
  if (is_first) {
    std::fill_n(vad.prioriSnrAvg, kMcraBins, 0);
    vad.frameSnr = 0;
  } else {
    update_surroundings(vad);
  }
  for (int k = 0; k < kMcraBins; ++k) {
    const Word32 posterior = posterior_snr_q10(vad.smoothedPeriodogram[k], vad.noisePower[k]);
    const Word64 carried = is_first ? 0 : carried_snr_q12(vad.gain[k], vad.postSnr[k]);
    const Word32 prior = saturated_word32(instantaneous_snr_q12(posterior) + carried);
    const Word32 v = snr_product_q12(posterior, prior);
    vad.gain[k] = amplitude_gain_q15(v, prior, is_first);
    vad.speechProb[k] = is_first ? first_probability_q31(v, prior)
                                 : probability_q31(v, prior, absence_of_bin_q31(vad, k));
    vad.postSnr[k] = posterior;
    vad.prioriSnr[k] = prior;
  }
}

}  // namespace orvalis
