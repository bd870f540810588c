#include "stream/frame_detector.h"

#include "Voice_Engine/channel/frame_screening.h"
#include "Voice_Engine/epd/epd_instance.h"

namespace orvalis {
namespace {

int32_t engine_mode(const UtteranceSettings &settings) {
  return settings.input_gain * 10000 + (settings.rate_hz == 16000 ? 0 : 1000);
}

}  // namespace

DecisionTiming decision_timing(const UtteranceSettings &settings) {
  const auto type = static_cast<uint32_t>(settings.content_type);
  const KepdTiming timing = timing_of(type, settings.rate_hz == 8000);
  const int32_t frame_samples = settings.rate_hz / 100;
  return {.frame_samples = frame_samples,
          .start_delay = timing.start_lag() * frame_samples,
          .end_delay = timing.end_lag() * frame_samples,
          .refused_run = type < 2 ? 0 : kShortUtterance};
}

bool FrameDetector::open(const UtteranceSettings &settings) {
  content_type_ = settings.content_type;
  frame_samples_ = decision_timing(settings).frame_samples;
  epd_ = EPD_Create(engine_mode(settings), settings.pcm_dump);
  return epd_ != nullptr;
}

void FrameDetector::close() { freeMemory_EPD(epd_); }

FrameDetector::Decision FrameDetector::process(const int16_t *frame) {
  int32_t small_samples = 0;
  const bool is_null = is_null_frame(frame, frame_samples_, small_samples);
  EpdReasons reasons;
  return {EPD_Proc_Frame(epd_, frame, frame_samples_, content_type_, reasons) == 1, is_null};
}

}  // namespace orvalis
