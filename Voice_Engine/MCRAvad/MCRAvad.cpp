// The MCRA detector: its parts in a frame's order, and the exported entries.
#include "Voice_Engine/MCRAvad/MCRAvad.h"

#include <cstddef>
#include <cstring>

#include "Voice_Engine/MCRAvad/frame_decision.h"
#include "Voice_Engine/MCRAvad/mcra_detector.h"
#include "Voice_Engine/MCRAvad/noise_spectrum.h"
#include "Voice_Engine/MCRAvad/speech_presence.h"
#include "Voice_Engine/basic_op/word.h"
#include "Voice_Engine/platform/export.h"
#include "Voice_Engine/platform/log.h"

namespace orvalis {

void initialise_mcra(VADINFO &vad) {
  // Spectra, energies and `reserved`; configuration follows them.
  std::memset(&vad, 0, offsetof(VADINFO, historyUpdate));
  vad.frameIndex = -1;
  vad.energyThreshold = -1;
  // Far above any power: slots that hold no spectrum yet are never the minimum.
  std::memset(vad.minPower, 1, sizeof vad.minPower);
  std::memset(vad.minHistory, 1, sizeof vad.minHistory);
  vad.energyMargin = 2;
  vad.calibrationIndex = 0;
  vad.calibrationOlderSum = 0;
  vad.calibrationNewerSum = 0;
  vad.calibrationPeak = 0;
  vad.calibrationCount = 0;
}

void analyse_mcra_frame(VADINFO &vad, Word16 *frame, Word32 length) {
  count_up(vad.frameIndex);
  compute_periodogram(vad, frame, length);
  update_noise(vad);
  update_presence(vad);
}

bool process_mcra_frame(VADINFO &vad, Word16 *frame, Word32 length, float exponent) {
  analyse_mcra_frame(vad, frame, length);
  return decide_frame(vad, exponent);
}

}  // namespace orvalis

extern "C" {

ORVALIS_EXPORT void initialVADINFO(VADINFO **info) { orvalis::initialise_mcra(**info); }

ORVALIS_EXPORT void reset_MCRA_params(VADINFO **info) {
  using namespace orvalis;
  log_line(kLogDebug, kLogTag, "TQE: reset MCRA params");
  VADINFO &vad = **info;
  vad.energyMargin = 1;
  vad.lowThresholdSelect = 0;
  vad.calibrationMode = 0;
  vad.calibrationDone = 0;
  vad.calibrationPhase = 0;
  vad.calibrationIndex = 0;
  vad.calibrationCount = 0;
  vad.calibrationBest = 0;
  vad.calibrationOlderSum = 0;
  vad.calibrationNewerSum = 0;
  vad.calibrationPeak = 0;
  vad.energyThreshold = 0;  // what calibration finds for silence
}

ORVALIS_EXPORT void ApplyVAD(VADINFO **info, int16_t *frame, int32_t length) {
  orvalis::analyse_mcra_frame(**info, frame, length);
}

ORVALIS_EXPORT int32_t processVAD(VADINFO **info, int16_t *frame, int32_t length, float exponent) {
  return orvalis::process_mcra_frame(**info, frame, length, exponent) ? 1 : 0;
}

ORVALIS_EXPORT int32_t explainVAD(VADINFO **info, McraReasons *reasons) {
  return orvalis::explain_frame(**info, *reasons) ? 1 : 0;
}

}  // extern "C"
