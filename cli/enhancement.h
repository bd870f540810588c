// One input through the stages of the signal path into one output.
#pragma once

#include <enhancement_stream.h>

#include <functional>
#include <string>

#include "cli/detector_stage.h"
#include "cli/open_audio.h"
#include "cli/output_plan.h"
#include "cli/work_files.h"

namespace orvalis::cli {

struct PathSettings {
  AudioSettings audio;
  bool mix = false;  ///< Several channels are averaged, otherwise refused
  EnhancementSettings enhancement = ENHANCEMENT_SETTINGS_DEFAULT;
  bool detect = false;  ///< Utterances of what comes out
  UtteranceSettings detector = UTTERANCE_SETTINGS_DEFAULT;
  SplitSettings split;
  bool keep_rate = false;
  bool replace = false;
};

/// Writes the output while the input is read. `report` hears of utterances if they are to be
/// detected, `tell` of what the user should know. Throws AudioError, OutputError.
void enhance(const std::string &input, const PlannedOutput &output, const PathSettings &settings,
             Report &report, const std::function<void(const std::string &)> &tell,
             const Advanced &advanced);

}  // namespace orvalis::cli
