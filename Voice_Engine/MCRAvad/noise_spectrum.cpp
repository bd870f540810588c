#include "Voice_Engine/MCRAvad/noise_spectrum.h"

#include <algorithm>
#include <iterator>

#include "Voice_Engine/MCRAvad/noscale_fft_kernel.h"
#include "Voice_Engine/MCRAvad/rounding.h"
#include "Voice_Engine/MCRAvad/windows.h"

namespace orvalis {
namespace {

// 160 samples at full scale make a periodogram below 2^45, even without the window, and as the
// neighbours' weights add up to 4, smoothed powers below 2^47: sums of them need no saturation.
constexpr Word32 kFrameSamples = MCRA_FRAME_SAMPLES;

/// Weighted sum of a bin and its neighbours, as far as there are any.
Word64 smoothed_power(const Word64 *periodogram, int bin) {
  constexpr int kReach = 4;
  const int first = std::max(bin - kReach, 0);
  const int last = std::min(bin + kReach, kMcraBins - 1);
  const Word32 *weights =
      &orvalis_ZOLT_vadHamTable2[static_cast<std::size_t>(kReach - bin + first)];
  Word64 sum = 0;
  for (int k = first; k <= last; ++k) sum += weighted(periodogram[k], weights[k - first]);
  return sum;
}

/// Average of the smoothed powers over time.
Word64 averaged_power(Word64 average, Word64 power, bool is_first) {
  constexpr Word32 kKept_q31 = 2040109464;  // 0.95
  constexpr Word32 kTaken_q31 = 107374183;  // 0.05
  const Word64 taken = L64_mult_q31(power, kTaken_q31);
  return is_first ? taken : L64_mult_q31(average, kKept_q31) + taken;
}

/// What digital silence counts as: without a floor the first sound of any level would be speech.
constexpr Word64 kPowerFloor = 21474;  // 1e-5 in Q31

/// The slot of the ring that belongs to the frame takes the averages in.
void write_history(VADINFO &vad) {
  Word64 *slot = vad.minHistory[vad.frameIndex % MCRA_HISTORY];
  for (int k = 0; k < kMcraBins; ++k) slot[k] = std::max(vad.recursivePower[k], kPowerFloor);
}

/// Minima over the ring; of one that is not kept up, over all time.
void find_minima(VADINFO &vad, bool is_first) {
  const bool keeps_history = vad.historyUpdate == 1;
  if (is_first || keeps_history) write_history(vad);
  if (is_first || keeps_history) std::copy_n(vad.minHistory[0], kMcraBins, vad.minPower);
  if (is_first) return;
  for (const auto &slot : vad.minHistory) {
    for (int k = 0; k < kMcraBins; ++k) vad.minPower[k] = std::min(vad.minPower[k], slot[k]);
  }
}

/// Five times its minimum is what tells speech from noise in a bin.
bool indicates_speech(Word64 power, Word64 minimum) {
  return (minimum <= 1 ? power : power / minimum) > 4;
}

Word32 presence_average(Word32 average_q31, bool indicated, bool is_first) {
  constexpr Word32 kKept_q31 = 429496729;    // 0.2
  constexpr Word32 kTaken_q31 = 1717986918;  // 0.8
  const Word32 taken = indicated ? kTaken_q31 : 0;
  return is_first ? taken : saturated_sum(mult_q31(average_q31, kKept_q31), taken);
}

constexpr Word32 kSlowest_q31 = 2145336163;  // 0.999

/// How much of the noise estimate stays in the next frame: the more, the likelier speech is.
Word32 noise_smoothing(Word32 presence_q31) {
  constexpr Word32 kSpan_q31 = 2147484;  // 0.001: with the slowest it makes the largest value
  return kSlowest_q31 + mult_q31(presence_q31, kSpan_q31);
}

/// The estimate takes in the powers that were smoothed last, as they are one frame later.
Word64 noise_power(const VADINFO &vad, int bin, Word64 smoothed, bool is_first) {
  if (is_first) return L64_mult_q31(smoothed, kSlowest_q31);
  const Word32 kept_q31 = vad.noiseSmoothing[bin];
  return L64_mult_q31(vad.noisePower[bin], kept_q31) +
         L64_mult_q31(vad.smoothedPeriodogram[bin], MAX_32 - kept_q31);
}

}  // namespace

void take_periodogram(VADINFO &vad, Word16 *frame, Word32 length) {
  apply_window(std::min(length, kFrameSamples), frame, orvalis_ZOLT_vadHamTable1.data());
  Word32 re[256];
  Word32 im[256];
  unscaled_spectrum<256>(frame, kFrameSamples, re, im);
  for (int k = 0; k < kMcraBins; ++k)
    vad.periodogram[k] = Word64{re[k]} * re[k] + Word64{im[k]} * im[k];
}

void update_noise(VADINFO &vad) {
  const bool is_first = vad.frameIndex == 0;
  Word64 smoothed[kMcraBins];
  for (int k = 0; k < kMcraBins; ++k) {
    smoothed[k] = smoothed_power(vad.periodogram, k);
    vad.recursivePower[k] = averaged_power(vad.recursivePower[k], smoothed[k], is_first);
  }
  find_minima(vad, is_first);
  for (int k = 0; k < kMcraBins; ++k) {
    vad.noisePower[k] = noise_power(vad, k, smoothed[k], is_first);
    vad.smoothedPeriodogram[k] = smoothed[k];
    const bool indicated = indicates_speech(vad.recursivePower[k], vad.minPower[k]);
    const Word32 presence = presence_average(vad.presenceIndicatorAvg[k], indicated, is_first);
    vad.presenceIndicatorAvg[k] = presence;
    vad.noiseSmoothing[k] = noise_smoothing(presence);
  }
}

}  // namespace orvalis
