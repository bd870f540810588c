#include "Voice_Engine/MCRAvad/frame_decision.h"

#include <algorithm>
#include <cmath>

#include "Voice_Engine/MCRAvad/noise_spectrum.h"
#include "Voice_Engine/MCRAvad/threshold_calibration.h"
#include "Voice_Engine/basic_op/word.h"

namespace orvalis {
namespace {

constexpr Word32 kLastStartupFrame = 19;
constexpr Word32 kLastSummedFrame = 10;
constexpr Word32 kFirstSettledFrame = 80;

/// Energies and bins of a frame, or of a frame and its predecessor.
struct Measures {
  float energy = 0;
  float smoothed_energy = 0;
  float minimum_energy = 0;
  Word64 speech_bins = 0;
};

/// What the measures of two frames must exceed.
struct Thresholds {
  float energy;
  float smoothed_energy;
  Word64 speech_bins;
};

/// Sum of powers in Q31. Products with a power of two are exact, so fused multiply-adds give the
/// same bits.
float energy_of(const Word64 *powers) {
  float sum = 0;
  for (int k = 0; k < kMcraBins; ++k) sum += static_cast<float>(powers[k]) * 0x1p-31F;
  return sum;
}

Word64 speech_bins_of(const Word32 *probabilities_q31) {
  Word64 sum = 0;
  for (int k = 0; k < kMcraBins; ++k) sum += probabilities_q31[k];
  return sum >> 31;
}

/// The measures of the frame in the record; all 0 in the very first one.
Measures measure(const VADINFO &vad) {
  if (vad.frameIndex < 1) return {};
  return {energy_of(vad.periodogram), std::fabs(energy_of(vad.smoothedPeriodogram)),
          energy_of(vad.minPower), speech_bins_of(vad.speechProb)};
}

Measures operator+(const Measures &a, const Measures &b) {
  return {a.energy + b.energy, a.smoothed_energy + b.smoothed_energy,
          a.minimum_energy + b.minimum_energy, a.speech_bins + b.speech_bins};
}

/// Adds up the energies of the first frames. Returns the smoothed energy to keep for the next
/// frame: in place of one that is too loud for background, that of the previous frame.
float track_startup(VADINFO &vad, float two_frames, float smoothed_energy) {
  constexpr float kMaxBackground = 30;
  if (vad.frameIndex < 1 || vad.frameIndex > kLastStartupFrame) return smoothed_energy;
  if (vad.frameIndex <= kLastSummedFrame) vad.startupFrameEnergy += two_frames;
  const float carried =
      smoothed_energy <= kMaxBackground ? smoothed_energy : vad.prevSmoothedEnergy;
  vad.startupSmoothedEnergy += carried;
  return carried;
}

float startup_scale(float startup_energy) {
  if (startup_energy <= 10) return 0.5F;
  return startup_energy <= 20 ? 1 : startup_energy / 20;
}

/// The unit of energyMargin.
float energy_scale(const VADINFO &vad, float minimum_energy) {
  if (vad.frameIndex < kFirstSettledFrame) return 1;
  if (vad.calibrationEnable == 0) return startup_scale(vad.startupSmoothedEnergy);
  return minimum_energy;
}

Thresholds thresholds_of(const VADINFO &vad, const Measures &two_frames) {
  constexpr float kMinSmoothedEnergy = 0.4F;
  constexpr Word64 kSpeechBins = 40;
  const float floor = vad.lowThresholdSelect == 1 ? 0.097F : 0.1F;
  const float margin =
      static_cast<float>(vad.energyMargin) * energy_scale(vad, two_frames.minimum_energy);
  return {// The floor also where the threshold is not a number.
          .energy = vad.energyThreshold > floor ? vad.energyThreshold : floor,
          .smoothed_energy = margin < kMinSmoothedEnergy ? kMinSmoothedEnergy : margin,
          .speech_bins = kSpeechBins};
}

bool is_speech(const VADINFO &vad, const Measures &two_frames, const Thresholds &thresholds) {
  return vad.frameIndex >= 1 && two_frames.energy > thresholds.energy &&
         two_frames.smoothed_energy > thresholds.smoothed_energy &&
         two_frames.speech_bins > thresholds.speech_bins;
}

}  // namespace

bool decide_frame(VADINFO &vad, float exponent) {
  const Measures frame = measure(vad);
  const Measures previous = {vad.prevFrameEnergy, vad.prevSmoothedEnergy, vad.prevMinEnergy,
                             vad.prevSpeechBins};
  const Measures two_frames = frame + previous;
  const float carried = track_startup(vad, two_frames.energy, frame.smoothed_energy);
  const bool calibrates = vad.frameIndex >= kFirstSettledFrame && vad.calibrationEnable != 0 &&
                          vad.calibrationMode == 1;
  if (calibrates) calibrate_threshold(vad, frame.energy, exponent);
  vad.prevMinEnergy = frame.minimum_energy;
  vad.prevFrameEnergy = frame.energy;
  vad.prevSmoothedEnergy = carried;
  vad.prevSpeechBins = frame.speech_bins;
  return is_speech(vad, two_frames, thresholds_of(vad, two_frames));
}

bool explain_frame(const VADINFO &vad, McraReasons &reasons) {
  const Measures previous = {reasons.prevEnergy, reasons.prevSmoothedEnergy, reasons.prevMinEnergy,
                             reasons.prevSpeechBins};
  const Measures two_frames = measure(vad) + previous;
  const Thresholds thresholds = thresholds_of(vad, two_frames);
  const bool speech = is_speech(vad, two_frames, thresholds);
  reasons = {.frameIndex = vad.frameIndex,
             .answer = speech,
             .energy = two_frames.energy,
             .energyThreshold = thresholds.energy,
             .smoothedEnergy = two_frames.smoothed_energy,
             .smoothedThreshold = thresholds.smoothed_energy,
             .minEnergy = two_frames.minimum_energy,
             .frameSnr = static_cast<float>(vad.frameSnr) / 4096,
             .speechBins = two_frames.speech_bins,
             .speechBinsThreshold = thresholds.speech_bins,
             .prevEnergy = vad.prevFrameEnergy,
             .prevSmoothedEnergy = vad.prevSmoothedEnergy,
             .prevMinEnergy = vad.prevMinEnergy,
             .prevSpeechBins = vad.prevSpeechBins};
  return speech;
}

}  // namespace orvalis
