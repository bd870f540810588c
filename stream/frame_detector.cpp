#include "stream/frame_detector.h"

#include <algorithm>
#include <cstdlib>

#include "Voice_Engine/MCRAvad/frame_decision.h"
#include "Voice_Engine/MCRAvad/mcra_detector.h"
#include "Voice_Engine/epd/epd_instance.h"
#include "stream/lead_in.h"

namespace orvalis {

DecisionTiming decision_timing(const UtteranceSettings &settings) {
  if (settings.detector == UTTERANCE_MCRA) {
    return {
        .frame_samples = MCRA_FRAME_SAMPLES, .start_delay = 0, .end_delay = 0, .refused_run = 0};
  }
  const KepdTiming timing =
      timing_of(static_cast<uint32_t>(settings.content_type), settings.rate_hz == 8000);
  const int32_t frame_samples = settings.rate_hz / 100;
  // The closing pause is part of an utterance, so only the short timing can refuse one.
  return {.frame_samples = frame_samples,
          .start_delay = timing.start_lag() * frame_samples,
          .end_delay = timing.end_lag() * frame_samples,
          .refused_run = timing.pause_limit > kShortUtterance ? 0 : kShortUtterance};
}

bool FrameDetector::open(const UtteranceSettings &settings) {
  frame_samples_ = decision_timing(settings).frame_samples;
  if (settings.detector != UTTERANCE_MCRA) return open_epd(settings);
  constexpr McraSettings kDefault = MCRA_SETTINGS_DEFAULT;
  return open_mcra(settings.mcra != nullptr ? *settings.mcra : kDefault);
}

bool FrameDetector::open_epd(const UtteranceSettings &settings) {
  content_type_ = settings.content_type;
  const int32_t mode = settings.input_gain * 10000 + (settings.rate_hz == 16000 ? 0 : 1000);
  epd_ = EPD_Create(mode, settings.pcm_dump);
  return epd_ != nullptr;
}

bool FrameDetector::open_mcra(const McraSettings &settings) {
  mcra_ = static_cast<VADINFO *>(std::calloc(1, sizeof(VADINFO)));
  if (mcra_ == nullptr) return false;
  initialise_mcra(*mcra_);
  mcra_->historyUpdate = settings.historyUpdate;
  mcra_->energyMargin = settings.energyMargin;
  mcra_->lowThresholdSelect = settings.lowThresholdSelect;
  mcra_->calibrationEnable = settings.calibrationEnable;
  mcra_->calibrationMode = settings.calibrationMode;
  exponent_ = settings.exponent;
  return true;
}

void FrameDetector::close() {
  if (epd_ != nullptr) freeMemory_EPD(epd_);
  std::free(mcra_);
}

FrameDetector::Decision FrameDetector::process(const int16_t *frame) {
  if (mcra_ != nullptr) {
    Word16 windowed[MCRA_FRAME_SAMPLES];
    std::copy_n(frame, MCRA_FRAME_SAMPLES, windowed);
    const bool speech = process_mcra_frame(*mcra_, windowed, MCRA_FRAME_SAMPLES, exponent_);
    explain_frame(*mcra_, mcra_reasons_);
    return {.speech = speech, .is_null = false};
  }
  const Word32 speech = EPD_Proc_Frame(epd_, frame, frame_samples_, content_type_, epd_reasons_);
  return {.speech = speech == 1, .is_null = epd_reasons_.judged == 0};
}

void FrameDetector::lead_in(const int16_t *window) {
  const Word32 pcm_dump = epd_->pcmDumpEnabled;
  epd_->pcmDumpEnabled = 0;
  for (int32_t i = 0; i < kLeadInFrames; ++i) {
    Word16 frame[kMaxFrameSamples];
    make_lead_in_frame(window, frame_samples_, i, frame);
    process(frame);
  }
  epd_->pcmDumpEnabled = pcm_dump;
  reset_ALL_EPDparams(epd_);
}

}  // namespace orvalis
