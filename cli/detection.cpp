#include "cli/detection.h"

#include <orvalis.h>

#include <cstdint>
#include <memory>
#include <new>
#include <span>

#include "cli/audio_source.h"
#include "cli/excerpts.h"
#include "cli/split_names.h"

namespace orvalis::cli {
namespace {

struct StreamCloser {
  void operator()(UtteranceStream *stream) const { CloseUtteranceStream(stream); }
};

struct EpdCloser {
  void operator()(EpdInstance *epd) const { FreeMemoryEPD(epd); }
};

class Detection {
public:
  Detection(const std::string &name, const DetectionSettings &settings, Report &report,
            const std::function<void(const Advance &)> &advanced)
      : name_(name),
        settings_(settings),
        source_(name, settings.audio),
        report_(report),
        advanced_(advanced) {
    settings_.detector.rate_hz = source_.rate_hz();
  }

  void run() {
    report_.begin_file(name_, source_.rate_hz());
    if (settings_.frames) {
      report_frames();
    } else {
      report_utterances();
    }
    report_.end_file(source_.samples_read());
    // Last, so that a damaged file still gives what could be decided.
    source_.check_complete();
  }

private:
  void report_utterances() {
    const std::unique_ptr<UtteranceStream, StreamCloser> stream(
        OpenUtteranceStream(&settings_.detector));
    if (!stream) throw std::bad_alloc();
    std::unique_ptr<Excerpts> excerpts;
    if (!settings_.split_folder.empty())
      excerpts = make_excerpts(name_, settings_.audio, source_.rate_hz());

    const auto take_decided = [&] {
      for (Utterance found; NextUtterance(stream.get(), &found) == 1;) {
        // First, so that what is reported is there.
        if (excerpts)
          excerpts->write(found.start, found.end,
                          part_name(settings_.split_folder, name_, found.number),
                          settings_.replace);
        report_.utterance(found);
      }
      if (excerpts) excerpts->forget_before(EarliestUtteranceStart(stream.get()));
    };
    for (auto piece = source_.read(); !piece.empty(); piece = source_.read()) {
      if (excerpts) excerpts->hear(piece);
      while (!piece.empty()) {
        const auto taken =
            PushUtteranceAudio(stream.get(), piece.data(), static_cast<std::int32_t>(piece.size()));
        piece = piece.subspan(static_cast<std::size_t>(taken));
        take_decided();
      }
      tell_advance();
    }
    FlushUtteranceStream(stream.get());
    take_decided();
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
      report_.frame(number++, ProcessEPDFrameByCnttype(epd.get(), frame.data(), samples,
                                                       detector.content_type));
      tell_advance();
    });
  }

  void tell_advance() const {
    const std::chrono::duration<double> elapsed = Progress::Clock::now() - began_;
    advanced_({name_, static_cast<double>(source_.samples_read()) / source_.rate_hz(),
               source_.length_seconds(), elapsed.count()});
  }

  std::string name_;
  DetectionSettings settings_;
  AudioSource source_;
  Report &report_;
  const std::function<void(const Advance &)> &advanced_;
  Progress::Clock::time_point began_ = Progress::Clock::now();
};

}  // namespace

void detect(const std::string &name, const DetectionSettings &settings, Report &report,
            const std::function<void(const Advance &)> &advanced) {
  Detection(name, settings, report, advanced).run();
}

}  // namespace orvalis::cli
