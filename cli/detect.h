// One input through a voice detector into a report.
#pragma once

#include <utterance_stream.h>

#include <cstdint>
#include <memory>
#include <span>
#include <string>
#include <vector>

#include "cli/audio_source.h"
#include "cli/dump.h"
#include "cli/jobs.h"
#include "cli/report.h"
#include "cli/split.h"

namespace orvalis::cli {

/// When the detector learns the noise of a recording before it judges the beginning.
enum class LeadIn { kNever, kAlways, kNotOfStandardInput };

struct DetectorSettings {
  /// All but rate_hz, lead_in, mcra and, for the MCRA detector, hangover_ms.
  UtteranceSettings stream = UTTERANCE_SETTINGS_DEFAULT;
  LeadIn lead_in = LeadIn::kNever;
  McraSettings mcra = MCRA_SETTINGS_DEFAULT;
  std::int32_t min_silence_ms = 300;  ///< Of the MCRA detector: shorter silence is bridged
  Reported reported = Reported::kUtterances;
  SplitSettings split;
};

/// A voice detector that reports what it finds. The report outlives it.
class Detector {
public:
  /// `split` may be null.
  Detector(const std::string &input, int rate_hz, const DetectorSettings &settings,
           std::unique_ptr<Split> split, Report &report);

  Detector(const Detector &) = delete;
  Detector &operator=(const Detector &) = delete;

  /// Throws AudioError if an utterance cannot be written.
  void push(std::span<const std::int16_t> audio);
  void flush();

  /// Samples of the frames that the detector has judged and dumped.
  std::int64_t samples_judged() const { return samples_judged_; }

  /// Of what has been found so far; the clipped samples are for others to count.
  const Statistics &statistics() const { return statistics_; }

private:
  struct Close {
    void operator()(UtteranceStream *stream) const { CloseUtteranceStream(stream); }
  };
  struct Frame {
    std::int64_t start;
    int decision;
    Trace trace;
  };

  void note_frame(const UtteranceFrame &frame);
  void report_new();
  void report_silence_before(std::int64_t position);

  int rate_hz_;
  Reported reported_;
  std::unique_ptr<Split> split_;
  Report &report_;
  std::vector<Frame> frames_;  ///< Not reported yet: nothing may be thrown through the library
  std::int64_t frame_count_ = 0;
  std::int64_t samples_judged_ = 0;
  std::int64_t silence_start_ = 0;
  std::int32_t silence_count_ = 0;
  Statistics statistics_;
  std::unique_ptr<UtteranceStream, Close> stream_;
};

struct DetectSettings {
  AudioSettings audio;
  DetectorSettings detector;
  const Dump *dump = nullptr;  ///< Of the detector's dump files, if it writes them
};

/// Opens the job's input, with a warning about raw input that has a header. Throws AudioError.
AudioSource open_source(Job &job, const AudioSettings &settings);

/// After the end of the job's input: how many of its samples are clipped, if any.
void note_clipping(Job &job, const AudioSource &source);

/// After the end of the job's input: a warning if it is cut short and may be. Throws AudioError.
void check_complete(Job &job, const AudioSource &source);

/// Reports what is found in the job's input while it is read. Throws AudioError, after everything
/// that could be decided has been reported.
void detect(Job &job, const DetectSettings &settings, Report &report);

}  // namespace orvalis::cli
