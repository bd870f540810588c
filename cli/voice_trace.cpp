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

float VoiceTrace::smoothed_threshold(float minimum_energy) const {
  float scale = 1;
  if (vad_.frameIndex >= 80 && vad_.calibrationEnable != 0) {
    scale = minimum_energy + last_minimum_energy_;
  } else if (vad_.frameIndex >= 80) {
    const float startup = vad_.startupSmoothedEnergy;
    scale = startup <= 10 ? 0.5F : startup <= 20 ? 1 : startup / 20;
  }
  return std::max(0.4F, static_cast<float>(vad_.energyMargin) * scale);
}

Trace VoiceTrace::of_frame(bool speech) {
  const bool is_first = vad_.frameIndex == 0;  // its energies count as 0
  const float smoothed = is_first ? 0 : energy_of(vad_.smoothedPeriodogram);
  Trace trace = {
      {"answer", std::int64_t{speech}},
      {"energy", vad_.prevFrameEnergy + last_energy_},
      {"energy_threshold",
       std::max(vad_.lowThresholdSelect == 1 ? 0.097F : 0.1F, vad_.energyThreshold)},
      {"smoothed_energy", smoothed + last_smoothed_energy_},
      {"smoothed_threshold", smoothed_threshold(vad_.prevMinEnergy)},
      {"minimum_energy", vad_.prevMinEnergy + last_minimum_energy_},
      {"speech_bins", vad_.prevSpeechBins + last_bins_},
      {"frame_snr", static_cast<float>(vad_.frameSnr) / 4096},
  };
  last_energy_ = vad_.prevFrameEnergy;
  last_smoothed_energy_ = vad_.prevSmoothedEnergy;
  last_minimum_energy_ = vad_.prevMinEnergy;
  last_bins_ = vad_.prevSpeechBins;
  return trace;
}

}  // namespace orvalis::cli
