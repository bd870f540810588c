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

struct FrameMeasures {
  float energy = 0;
  float smoothed_energy = 0;
  float minimum_energy = 0;
  Word64 speech_bins = 0;
};

/// Sum of powers in Q31. A product with a power of two is exact, so it makes no difference whether
/// the processor fuses it with the sum.
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

FrameMeasures measure(const VADINFO &vad) {
  return {energy_of(vad.periodogram), std::fabs(energy_of(vad.smoothedPeriodogram)),
          energy_of(vad.minPower), speech_bins_of(vad.speechProb)};
}

/// Learns how loud the start is; gives the smoothed energy to carry on. Frames that are too loud
/// for a background count as their predecessor.
float learn_startup(VADINFO &vad, float two_frames, float smoothed_energy) {
  constexpr float kLoudest = 30;
  if (vad.frameIndex > kLastStartupFrame) return smoothed_energy;
  if (vad.frameIndex <= kLastSummedFrame) vad.startupFrameEnergy += two_frames;
  const float carried = smoothed_energy <= kLoudest ? smoothed_energy : vad.prevSmoothedEnergy;
  vad.startupSmoothedEnergy += carried;
  return carried;
}

float startup_scale(float startup_energy) {
  if (startup_energy <= 10) return 0.5F;
  return startup_energy <= 20 ? 1 : startup_energy / 20;
}

/// What the margin of the smoothed energy is counted in.
float energy_scale(const VADINFO &vad, float minimum_energy) {
  if (vad.frameIndex < kFirstSettledFrame) return 1;
  if (vad.calibrationEnable == 0) return startup_scale(vad.startupSmoothedEnergy);
  return minimum_energy + vad.prevMinEnergy;
}

/// A threshold that is not a number counts as none.
float threshold_of(const VADINFO &vad) {
  const float floor = vad.lowThresholdSelect == 1 ? 0.097F : 0.1F;
  return vad.energyThreshold > floor ? vad.energyThreshold : floor;
}

bool is_speech(const VADINFO &vad, const FrameMeasures &frame, float two_frames, float scale) {
  constexpr float kLeastSmoothedEnergy = 0.4F;
  constexpr Word64 kSpeechBinsOfTwoFrames = 40;
  const float smoothed_energy = frame.smoothed_energy + vad.prevSmoothedEnergy;
  return two_frames > threshold_of(vad) &&
         smoothed_energy > static_cast<float>(vad.energyMargin) * scale &&
         smoothed_energy > kLeastSmoothedEnergy &&
         frame.speech_bins + vad.prevSpeechBins > kSpeechBinsOfTwoFrames;
}

}  // namespace

bool decide_frame(VADINFO &vad, float exponent) {
  FrameMeasures frame;
  float carried = 0;
  bool decision = false;
  if (vad.frameIndex >= 1) {
    frame = measure(vad);
    const float two_frames = frame.energy + vad.prevFrameEnergy;
    carried = learn_startup(vad, two_frames, frame.smoothed_energy);
    const float scale = energy_scale(vad, frame.minimum_energy);
    const bool calibrates = vad.frameIndex >= kFirstSettledFrame && vad.calibrationEnable != 0 &&
                            vad.calibrationMode == 1;
    if (calibrates) calibrate_threshold(vad, frame.energy, exponent);
    decision = is_speech(vad, frame, two_frames, scale);
  }
  vad.prevMinEnergy = frame.minimum_energy;
  vad.prevFrameEnergy = frame.energy;
  vad.prevSmoothedEnergy = carried;
  vad.prevSpeechBins = frame.speech_bins;
  return decision;
}

}  // namespace orvalis
