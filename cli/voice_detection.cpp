#include "cli/voice_detection.h"

#include <MCRAvad.h>

#include <algorithm>
#include <memory>
#include <span>

#include "cli/report_input.h"
#include "cli/segments.h"
#include "cli/voice_trace.h"

namespace orvalis::cli {
namespace {

class VoiceDetection {
public:
  VoiceDetection(const std::string &name, const VoiceSettings &settings, Report &report,
                 const Advanced &advanced)
      : name_(name),
        settings_(settings),
        source_(name, settings.audio),
        report_(report),
        advanced_(advanced) {
    VADINFO *vad = vad_.get();
    initialVADINFO(&vad);
    vad->energyMargin = settings.energy_margin;
    vad->historyUpdate = settings.history;
    vad->lowThresholdSelect = settings.low_threshold;
    vad->calibrationMode = settings.calibrate;
    vad->calibrationEnable = settings.calibrate || settings.margin_over_minima;
  }

  void run() {
    report_input(name_, source_, report_, [this] {
      if (settings_.trace) {
        report_trace();
      } else {
        report_segments();
      }
    });
  }

private:
  void report_segments() {
    const auto samples = [this](int ms) { return std::int64_t{ms} * source_.rate_hz() / 1000; };
    Segments segments({samples(settings_.min_speech_ms), samples(settings_.min_silence_ms),
                       samples(settings_.pad_before_ms), samples(settings_.pad_after_ms)},
                      [this](const Utterance &segment) { report_.utterance(segment); });
    for_each_answer([&](bool speech) { segments.hear(speech, MCRA_FRAME_SAMPLES); });
    segments.end(source_.samples_read() % MCRA_FRAME_SAMPLES);
  }

  void report_trace() {
    VoiceTrace trace(*vad_);
    for_each_answer([&](bool speech) {
      const std::int64_t number = vad_->frameIndex;
      const auto start = static_cast<double>(number * MCRA_FRAME_SAMPLES) / source_.rate_hz();
      report_.trace(number, start, trace.of_frame(speech));
    });
  }

  template <class Take>
  void for_each_answer(Take take) {
    source_.for_each_block(MCRA_FRAME_SAMPLES, [&](std::span<const std::int16_t> block) {
      std::int16_t frame[MCRA_FRAME_SAMPLES];  // the detector's window is put on it
      std::ranges::copy(block, frame);
      VADINFO *vad = vad_.get();
      take(processVAD(&vad, frame, MCRA_FRAME_SAMPLES, settings_.exponent) == 1);
      advanced_(advance_of(name_, source_, began_));
    });
  }

  std::string name_;
  VoiceSettings settings_;
  AudioSource source_;
  Report &report_;
  const Advanced &advanced_;
  Progress::Clock::time_point began_ = Progress::Clock::now();
  std::unique_ptr<VADINFO> vad_ = std::make_unique<VADINFO>();
};

}  // namespace

void detect_voice(const std::string &name, const VoiceSettings &settings, Report &report,
                  const Advanced &advanced) {
  VoiceDetection(name, settings, report, advanced).run();
}

}  // namespace orvalis::cli
