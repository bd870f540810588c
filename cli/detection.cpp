#include "cli/detection.h"

#include <orvalis.h>

#include <algorithm>
#include <cstdint>
#include <cstdlib>
#include <memory>
#include <new>
#include <span>
#include <utility>
#include <vector>

#include "cli/audio_source.h"
#include "cli/excerpts.h"
#include "cli/report_input.h"

namespace orvalis::cli {
namespace {

struct EpdCloser {
  void operator()(EpdInstance *epd) const { FreeMemoryEPD(epd); }
};

/// Of what the detector keeps to itself only its answer is known; the level is that of the audio.
Trace trace_of(std::int32_t answer, std::span<const std::int16_t> frame) {
  const auto samples = static_cast<std::int32_t>(frame.size());
  const auto peak = std::ranges::max(frame, {}, [](int sample) { return std::abs(sample); });
  return {{"answer", std::int64_t{answer}},
          {"energy", std::int64_t{computeEnergy(frame.data(), samples)}},
          {"peak", std::int64_t{std::abs(peak)}}};
}

class Detection {
public:
  Detection(const std::string &name, const DetectionSettings &settings, Report &report,
            const Advanced &advanced)
      : name_(name),
        settings_(settings),
        source_(name, settings.audio),
        report_(report),
        advanced_(advanced) {
    settings_.detector.rate_hz = source_.rate_hz();
  }

  void run() {
    report_input(name_, source_, report_, [this] {
      if (settings_.frames || settings_.trace) {
        report_frames();
      } else {
        report_utterances();
      }
    });
  }

private:
  void report_utterances() {
    std::unique_ptr<Excerpts> excerpts;
    if (!settings_.split.folder.empty())
      excerpts = make_excerpts(name_, settings_.audio, source_.rate_hz());
    DetectorStage detector(name_, settings_.detector, settings_.split, std::move(excerpts),
                           report_);
    std::vector<std::int16_t> passed;
    for (auto piece = source_.read(); !piece.empty(); piece = source_.read()) {
      passed.clear();
      detector.push(piece, passed);
      tell_advance();
    }
    detector.flush(passed);
  }

  void report_frames() {
    const UtteranceSettings &detector = settings_.detector;
    const bool narrow_band = detector.rate_hz == 8000;
    const std::size_t frame_length = narrow_band ? 80 : 160;
    const std::int32_t mode = detector.input_gain * 10000 + (narrow_band ? 1000 : 0);
    const std::unique_ptr<EpdInstance, EpdCloser> epd(InitializeEPD(mode, detector.pcm_dump));
    if (!epd) throw std::bad_alloc();

    std::int64_t number = 0;
    source_.for_each_block(frame_length, [&](std::span<const std::int16_t> frame) {
      const auto samples = static_cast<std::int32_t>(frame.size());
      const std::int32_t answer =
          ProcessEPDFrameByCnttype(epd.get(), frame.data(), samples, detector.content_type);
      if (settings_.trace) {
        report_.trace(number, static_cast<double>(number) / 100, trace_of(answer, frame));
      } else {
        report_.frame(number, answer);
      }
      ++number;
      tell_advance();
    });
  }

  void tell_advance() const { advanced_(advance_of(name_, source_, began_)); }

  std::string name_;
  DetectionSettings settings_;
  AudioSource source_;
  Report &report_;
  const Advanced &advanced_;
  Progress::Clock::time_point began_ = Progress::Clock::now();
};

}  // namespace

void detect(const std::string &name, const DetectionSettings &settings, Report &report,
            const Advanced &advanced) {
  Detection(name, settings, report, advanced).run();
}

}  // namespace orvalis::cli
