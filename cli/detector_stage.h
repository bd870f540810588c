// The end-point detector as a stage: audio passes unchanged, its utterances go to a report.
#pragma once

#include <utterance_stream.h>

#include <memory>
#include <string>

#include "cli/excerpts.h"
#include "cli/report.h"
#include "cli/stage.h"

namespace orvalis::cli {

/// Files of their own for the utterances of an input.
struct SplitSettings {
  std::string folder;    ///< "" for none
  bool replace = false;  ///< Files that are there already give way
};

class DetectorStage : public Stage {
public:
  /// `excerpts` is where the files' audio comes from; null without files. `report` outlives the
  /// stage, and is told of utterances only.
  DetectorStage(std::string name, const UtteranceSettings &detector, SplitSettings split,
                std::unique_ptr<Excerpts> excerpts, Report &report);

  void push(std::span<const std::int16_t> input, std::vector<std::int16_t> &output) override;
  void flush(std::vector<std::int16_t> &output) override;

private:
  struct Close {
    void operator()(UtteranceStream *stream) const { CloseUtteranceStream(stream); }
  };

  void take_decided();

  std::string name_;
  SplitSettings split_;
  std::unique_ptr<Excerpts> excerpts_;
  Report &report_;
  std::unique_ptr<UtteranceStream, Close> stream_;
};

}  // namespace orvalis::cli
