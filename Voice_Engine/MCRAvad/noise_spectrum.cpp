#include "Voice_Engine/MCRAvad/noise_spectrum.h"

#include <algorithm>
#include <iterator>

#include "Voice_Engine/MCRAvad/noscale_fft_kernel.h"
#include "Voice_Engine/MCRAvad/rounding.h"
#include "Voice_Engine/MCRAvad/windows.h"

namespace orvalis {
namespace {

// 160 samples at full scale make a periodogram below 2^45, even without the window, and S_f below
// 2^47, as the weights add up to 4: sums of them need no saturation.
constexpr Word32 kFrameSamples = MCRA_FRAME_SAMPLES;

/// S_f: the weighted sum of a bin and its neighbours, as far as there are any.
Word64 frequency_smoothed(const Word64 *periodogram, int bin) {
  constexpr int kReach = 4;
  const int first = std::max(bin - kReach, 0);
  const int last = std::min(bin + kReach, kMcraBins - 1);
  const Word32 *weights =
      &orvalis_ZOLT_vadHamTable2[static_cast<std::size_t>(kReach - bin + first)];
  Word64 sum = 0;
  for (int k = first; k <= last; ++k) sum += weighted(periodogram[k], weights[k - first]);
  return sum;
}

/// S = alpha_s S + (1 - alpha_s) S_f
Word64 time_smoothed(Word64 S, Word64 S_f, bool is_first) {
  constexpr Word32 kAlphaS_q31 = 2040109464;         // 0.95
  constexpr Word32 kOneMinusAlphaS_q31 = 107374183;  // 0.05
  const Word64 present = L64_mult_q31(S_f, kOneMinusAlphaS_q31);
  return is_first ? present : L64_mult_q31(S, kAlphaS_q31) + present;
}

/// The floor of S_min. Without it, the first sound after digital silence would be speech.
constexpr Word64 kPowerFloor = 21474;  // 1e-5 in Q31

/// Stores S in the frame's slot of the ring.
void write_history(VADINFO &vad) {
  Word64 *slot = vad.minHistory[vad.frameIndex % MCRA_HISTORY];
  for (int k = 0; k < kMcraBins; ++k) slot[k] = std::max(vad.recursivePower[k], kPowerFloor);
}

/// S_min: the minimum over the ring, or over all time if the ring is not updated.
void update_minima(VADINFO &vad, bool is_first) {
  const bool updates_ring = vad.historyUpdate == 1;
  if (is_first || updates_ring) write_history(vad);
  if (is_first || updates_ring) std::copy_n(vad.minHistory[0], kMcraBins, vad.minPower);
  if (is_first) return;
  for (const auto &slot : vad.minHistory) {
    for (int k = 0; k < kMcraBins; ++k) vad.minPower[k] = std::min(vad.minPower[k], slot[k]);
  }
}

/// I: whether S is five times its minimum.
bool indicates_speech(Word64 S, Word64 S_min) { return (S_min <= 1 ? S : S / S_min) > 4; }

/// p' = alpha_p p' + (1 - alpha_p) I
Word32 presence_average(Word32 p_q31, bool I, bool is_first) {
  constexpr Word32 kAlphaP_q31 = 429496729;           // 0.2
  constexpr Word32 kOneMinusAlphaP_q31 = 1717986918;  // 0.8
  const Word32 present = I ? kOneMinusAlphaP_q31 : 0;
  return is_first ? present : saturated_sum(mult_q31(p_q31, kAlphaP_q31), present);
}

constexpr Word32 kAlphaD_q31 = 2145336163;  // 0.999

/// alpha_d + (1 - alpha_d) p': the likelier speech, the slower the noise follows.
Word32 noise_smoothing(Word32 p_q31) {
  constexpr Word32 kOneMinusAlphaD_q31 = MAX_32 - kAlphaD_q31;
  return kAlphaD_q31 + mult_q31(p_q31, kOneMinusAlphaD_q31);
}

/// lambda_d, smoothed with the S_f and the factor of the previous frame: it is a frame late.
Word64 noise_power(const VADINFO &vad, int bin, Word64 S_f, bool is_first) {
  if (is_first) return L64_mult_q31(S_f, kAlphaD_q31);
  const Word32 alpha_q31 = vad.noiseSmoothing[bin];
  return L64_mult_q31(vad.noisePower[bin], alpha_q31) +
         L64_mult_q31(vad.smoothedPeriodogram[bin], MAX_32 - alpha_q31);
}

}  // namespace

void compute_periodogram(VADINFO &vad, Word16 *frame, Word32 length) {
  apply_window(std::min(length, kFrameSamples), frame, orvalis_ZOLT_vadHamTable1.data());
  Word32 re[256];
  Word32 im[256];
  unscaled_spectrum<256>(frame, kFrameSamples, re, im);
  for (int k = 0; k < kMcraBins; ++k)
    vad.periodogram[k] = Word64{re[k]} * re[k] + Word64{im[k]} * im[k];
}

void update_noise(VADINFO &vad) {
  const bool is_first = vad.frameIndex == 0;
  Word64 S_f[kMcraBins];
  for (int k = 0; k < kMcraBins; ++k) {
    S_f[k] = frequency_smoothed(vad.periodogram, k);
    vad.recursivePower[k] = time_smoothed(vad.recursivePower[k], S_f[k], is_first);
  }
  update_minima(vad, is_first);
  for (int k = 0; k < kMcraBins; ++k) {
    vad.noisePower[k] = noise_power(vad, k, S_f[k], is_first);
    vad.smoothedPeriodogram[k] = S_f[k];
    const bool I = indicates_speech(vad.recursivePower[k], vad.minPower[k]);
    const Word32 p_q31 = presence_average(vad.presenceIndicatorAvg[k], I, is_first);
    vad.presenceIndicatorAvg[k] = p_q31;
    vad.noiseSmoothing[k] = noise_smoothing(p_q31);
  }
}

}  // namespace orvalis
