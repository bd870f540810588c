// Dynamics control as a stage.
#pragma once

#include "cli/frame_stage.h"
#include "cli/occurrences.h"

namespace orvalis::cli {

class LevelStage : public FrameStage {
public:
  /// `loud_frames` outlives the stage.
  explicit LevelStage(Occurrences &loud_frames);
  ~LevelStage() override;

private:
  void work(std::span<const std::int16_t> input, OutputFrame output) override;

  std::int64_t drc_;
  std::int64_t position_ = 0;
  Occurrences &loud_frames_;
};

}  // namespace orvalis::cli
