// A voice detector as a stage: audio passes unchanged, what it finds goes to a report.
#pragma once

#include <utterance_stream.h>

#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "cli/excerpts.h"
#include "cli/report.h"
#include "cli/stage.h"

namespace orvalis::cli {

/// Files of their own for the utterances of an input.
struct SplitSettings {
  std::string folder;    ///< "" for none
  bool replace = false;  ///< Files that are there already give way
};

/// UtteranceSettings.lead_in until the input is known: standard input is live, and answered at
/// once.
inline constexpr std::int32_t kLeadInForFiles = 2;

/// What a report is told of.
enum class Reported { kUtterances, kFrames, kTrace };

class DetectorStage : public Stage {
public:
  /// `excerpts` is where the files' audio comes from; null without files. `report` outlives the
  /// stage, and is told of what is found only.
  DetectorStage(std::string name, UtteranceSettings detector, SplitSettings split,
                std::unique_ptr<Excerpts> excerpts, Report &report,
                Reported reported = Reported::kUtterances);

  void push(std::span<const std::int16_t> input, std::vector<std::int16_t> &output) override;
  void flush(std::vector<std::int16_t> &output) override;

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

  std::string name_;
  int rate_hz_;
  SplitSettings split_;
  std::unique_ptr<Excerpts> excerpts_;
  Report &report_;
  Reported reported_;
  std::vector<Frame> frames_;  ///< Not reported yet: nothing may be thrown through the library
  std::int64_t frame_count_ = 0;
  std::unique_ptr<UtteranceStream, Close> stream_;
};

}  // namespace orvalis::cli
