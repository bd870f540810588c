#include "cli/voice_trace.h"

#include <algorithm>

namespace orvalis::cli {
namespace {

/// In single precision and in the order of the bins, as the detector sums it.
float energy_of(const std::int64_t *powers) {
  float sum = 0;
  for (int k = 0; k < MCRA_BINS; ++k) sum += static_cast<float>(powers[k]) * 0x1p-31F;
  return sum;
}

}  // namespace

float VoiceTrace::smoothed_threshold(const VADINFO &vad) const {
  float scale = 1;
  if (vad.frameIndex >= 80 && vad.calibrationEnable != 0) {
    scale = vad.prevMinEnergy + last_minimum_energy_;
  } else if (vad.frameIndex >= 80) {
    const float startup = vad.startupSmoothedEnergy;
    scale = startup <= 10 ? 0.5F : startup <= 20 ? 1 : startup / 20;
  }
  return std::max(0.4F, static_cast<float>(vad.energyMargin) * scale);
}

Trace VoiceTrace::of_frame(const VADINFO &vad, bool speech) {
  const bool is_first = vad.frameIndex == 0;  // its energies count as 0
  const float smoothed = is_first ? 0 : energy_of(vad.smoothedPeriodogram);
  Trace trace = {
      {"answer", std::int64_t{speech}},
      {"energy", vad.prevFrameEnergy + last_energy_},
      {"energy_threshold",
       std::max(vad.lowThresholdSelect == 1 ? 0.097F : 0.1F, vad.energyThreshold)},
      {"smoothed_energy", smoothed + last_smoothed_energy_},
      {"smoothed_threshold", smoothed_threshold(vad)},
      {"minimum_energy", vad.prevMinEnergy + last_minimum_energy_},
      {"speech_bins", vad.prevSpeechBins + last_bins_},
      {"frame_snr", static_cast<float>(vad.frameSnr) / 4096},
  };
  last_energy_ = vad.prevFrameEnergy;
  last_smoothed_energy_ = vad.prevSmoothedEnergy;
  last_minimum_energy_ = vad.prevMinEnergy;
  last_bins_ = vad.prevSpeechBins;
  return trace;
}

}  // namespace orvalis::cli
