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
constexpr Word32 kMaxAbsence_q31 = 2040109466;  // q_max, 0.95: speech may set in at any time

// ---- SNR of a bin ------------------------------------------------------------------------------

/// gamma = S_f / lambda_d
Word32 posterior_snr_q10(Word64 power, Word64 noise) {
  return saturated_word32(noise < 2 ? power : L64_quotient<10>(power, noise));
}

// xi is decision-directed: alpha G^2 gamma of the previous frame and (1 - alpha) (gamma - 1) of
// this one, with an alpha of 0.92.

/// (1 - alpha) (gamma - 1), never 0.
Word64 present_snr_q12(Word32 gamma_q10) {
  constexpr Word64 kOneMinusAlpha_q31 = 171798692;  // 0.08
  constexpr Word64 kOne_q10 = 1024;
  constexpr Word32 kMinGamma_q10 = 1026;
  if (gamma_q10 <= kMinGamma_q10) return 1;
  return rounded_shift_right((gamma_q10 - kOne_q10) * kOneMinusAlpha_q31, 29);
}

/// alpha G^2 gamma. G is below 2^21, as the exponential integral adds a factor of at most e^3.9; so
/// the last product stays below 2^60.
Word64 past_snr_q12(Word64 G_q15, Word32 gamma_q10) {
  constexpr Word64 kTwiceAlpha_q30 = 1975684956;  // 1.84
  const Word64 scaled = rounded_shift_right(G_q15 * kTwiceAlpha_q30, 30);
  return rounded_shift_right(G_q15 * rounded_shift_right(scaled * gamma_q10, 14), 15);
}

/// v = gamma xi / (1 + xi)
Word32 v_of_q12(Word32 gamma_q10, Word32 xi_q12) {
  const Word64 product = L64_shl(Word64{gamma_q10} * xi_q12, 3);
  return saturated_word32(rounded_half(product / (xi_q12 + kOne_q12)));
}

/// G, the gain of the log-spectral amplitude: xi / (1 + xi) e^(E1(v) / 2)
Word32 amplitude_gain_q15(Word32 v_q12, Word32 xi_q12, bool is_first) {
  if (xi_q12 == 0) return 0;
  constexpr Word64 kMax_q32 = Word64{20} << 32;
  const Word64 half = std::clamp(rounded_half(expint_q32(v_q12)), -kMax_q32, kMax_q32);
  const Word64 half_q26 = is_first ? half >> 6 : rounded_shift_right(half, 6);
  const Word64 raised = saturated_product(exp_q32(static_cast<Word32>(half_q26)), xi_q12);
  return saturated_word32(rounded_shift_right(raised, 17) / (xi_q12 + kOne_q12));
}

// ---- SNR of the surroundings --------------------------------------------------------------------

/// zeta = beta zeta + (1 - beta) xi
Word32 averaged_snr_q12(Word32 zeta_q12, Word32 xi_q12) {
  constexpr Word32 kBeta_q31 = 1503238554;         // 0.7
  constexpr Word32 kOneMinusBeta_q31 = 644245094;  // 0.3
  return saturated_sum(mult_q31(zeta_q12, kBeta_q31), mult_q31(xi_q12, kOneMinusBeta_q31));
}

/// zeta_global: five times the weighted mean of a bin and 20 neighbours on either side. Near the
/// edges there are fewer, and the weights still begin with the first of the table.
Word32 global_snr_q12(const Word32 *zeta_q12, int bin) {
  constexpr int kReach = 20;
  const int first = std::max(bin - kReach, 0);
  const int last = std::min(bin + kReach, kMcraBins - 1);
  Word64 sum = 0;
  for (int k = first; k <= last; ++k)
    sum += weighted(zeta_q12[k], orvalis_ZOLT_vadHamTable3[static_cast<std::size_t>(k - first)]);
  return saturated_word32(rounded_shift_right(sum, 2));
}

/// zeta_frame: the mean over the lower third of the spectrum, where voices are.
Word32 frame_snr_q12(const Word32 *zeta_q12) {
  constexpr int kLowBins = 41;
  Word64 sum = 0;
  for (int k = 0; k < kLowBins; ++k) sum += zeta_q12[k];
  return saturated_word32(rounded_shift_right(sum * 32 / kLowBins, 5));
}

/// The likelihood of speech: 0 below zeta_min, 1 from zeta_max on, between them linear in ln zeta.
struct LogRamp {
  Word32 zeta_min_q12;
  Word32 zeta_max_q12;
  Word64 offset_q26;  // 4 ln 2 - ln zeta_min: the logarithm takes Q12 for Q16

  Word32 operator()(Word32 zeta_q12) const {
    constexpr Word64 kSpan_q29 = 1483429151;  // ln(zeta_max / zeta_min)
    if (zeta_q12 < zeta_min_q12) return 0;
    if (zeta_q12 >= zeta_max_q12) return MAX_32;
    const Word64 above_q26 = ln_q26(static_cast<std::uint32_t>(zeta_q12)) + offset_q26;
    return saturated_word32(above_q26 * (1 << 28) / kSpan_q29 * 64);
  }
};

constexpr LogRamp kLocalLikelihood{8174, 129527, 139708119};  // P_local: 3 dB to 15 dB
constexpr LogRamp kGlobalLikelihood{2044, 32382, 232740758};  // P_global: -3 dB to 9 dB
constexpr Word32 kMinFrameSnr_q12 = 8174;                     // P_frame is 1 from here: 3 dB

/// q = 1 - P_frame P_local P_global, at most 0.95
Word32 absence_prior_q31(Word32 frame_q31, Word32 local_q31, Word32 global_q31) {
  const Word32 presence = mult_q31(mult_q31(frame_q31, local_q31), global_q31);
  return std::min(MAX_32 - presence, kMaxAbsence_q31);
}

// ---- Probability of speech ---------------------------------------------------------------------

/// e^-v in Q32, with v limited to 20.
Word64 decay_q32(Word32 v_q12) {
  constexpr Word32 kMax_q12 = 20 * 4096;
  return exp_q32(-std::clamp(v_q12, -kMax_q12, kMax_q12) * (1 << 14));
}

/// Probabilities up to 0.051 count as 0. In the first frame the limit is one unit higher.
constexpr Word32 kNegligible_q31 = 109521665;

Word32 without_negligible(Word64 p_q31, Word32 negligible_q31) {
  return p_q31 <= negligible_q31 ? 0 : saturated_word32(p_q31);
}

/// 18 / (2 + 19 (1 + xi) e^-v), at most 1: the first frame has no zeta, and q is 0.95.
Word32 first_probability_q31(Word32 v_q12, Word32 xi_q12) {
  constexpr Word64 kEighteen_q38 = 4947802324992;
  constexpr Word64 kTwo_q6 = 128;
  const Word32 scaled = mult_q31(saturated_word32(xi_q12 + kOne_q12), kMaxAbsence_q31);
  // The first frame's xi is below 2^30, so the product stays below 2^62.
  const Word64 odds_q6 = (20 * ((decay_q32(v_q12) * scaled) >> 6)) >> 32;
  return without_negligible(rounded_half(kEighteen_q38 / (odds_q6 + kTwo_q6)), kNegligible_q31 + 1);
}

/// p = 1 / (1 + q / (1 - q) (1 + xi) e^-v)
Word32 probability_q31(Word32 v_q12, Word32 xi_q12, Word32 q_q31) {
  constexpr Word64 kOne_q16 = 65536;
  const Word64 decay = decay_q32(v_q12);
  const Word32 scaled = mult_q31(saturated_word32(xi_q12 + kOne_q12), q_q31);
  if (scaled == 0 || decay == 0) return MAX_32;
  // q is at most 0.95, so the quotient is below 2^37. Odds beyond 32 bits make p negligible.
  const Word64 odds_q16 = 4 * (L64_shl(decay * scaled, 1) / (MAX_32 - q_q31));
  return without_negligible((Word64{1} << 62) / (odds_q16 + kOne_q16) >> 15, kNegligible_q31);
}

/// zeta and zeta_frame, from the xi of the previous frame.
void update_surroundings(VADINFO &vad) {
  for (int k = 0; k < kMcraBins; ++k)
    vad.prioriSnrAvg[k] = averaged_snr_q12(vad.prioriSnrAvg[k], vad.prioriSnr[k]);
  vad.frameSnr = frame_snr_q12(vad.prioriSnrAvg);
}

Word32 absence_of_bin_q31(const VADINFO &vad, int bin) {
  const Word32 frame = vad.frameSnr >= kMinFrameSnr_q12 ? MAX_32 : 0;
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
    const Word32 gamma = posterior_snr_q10(vad.smoothedPeriodogram[k], vad.noisePower[k]);
    const Word64 past = is_first ? 0 : past_snr_q12(vad.gain[k], vad.postSnr[k]);
    const Word32 xi = saturated_word32(present_snr_q12(gamma) + past);
    const Word32 v = v_of_q12(gamma, xi);
    vad.gain[k] = amplitude_gain_q15(v, xi, is_first);
    vad.speechProb[k] = is_first ? first_probability_q31(v, xi)
                                 : probability_q31(v, xi, absence_of_bin_q31(vad, k));
    vad.postSnr[k] = gamma;
    vad.prioriSnr[k] = xi;
  }
}

}  // namespace orvalis
