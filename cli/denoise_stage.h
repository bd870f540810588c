// Noise suppression as a stage.
#pragma once

#include <orvalis.h>

#include "cli/frame_stage.h"

namespace orvalis::cli {

struct DenoiseSettings {
  int microphones = 1;  ///< 2 takes interleaved pairs
  int level_db = 13;    ///< With one microphone, 13 or 18
  bool aligned = true;  ///< The output is not later than the input
};

/// Where the engine suppresses nothing, the input comes out (of two microphones the first one,
/// which is the one that it cleans).
class DenoiseStage : public FrameStage {
public:
  explicit DenoiseStage(const DenoiseSettings &settings);

private:
  struct Release {
    void operator()(NsInstance *ns) const { FreeMemoryNS(ns); }
  };

  void work(std::span<const std::int16_t> input, OutputFrame output) override;

  std::unique_ptr<NsInstance, Release> ns_;
};

}  // namespace orvalis::cli
