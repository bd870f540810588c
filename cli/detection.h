// One input through the end-point detector into a report.
#pragma once

#include <utterance_stream.h>

#include <string>

#include "cli/detector_stage.h"
#include "cli/open_audio.h"
#include "cli/report.h"
#include "cli/work_files.h"

namespace orvalis::cli {

struct DetectionSettings {
  AudioSettings audio;
  UtteranceSettings detector = UTTERANCE_SETTINGS_DEFAULT;
  bool frames = false;  ///< Answers to frames instead of utterances
  bool trace = false;   ///< The same with the frames' levels
  SplitSettings split;
};

/// Reports what is found in an input while it is read. Throws AudioError or OutputError, after what
/// could be decided.
void detect(const std::string &name, const DetectionSettings &settings, Report &report,
            const Advanced &advanced);

}  // namespace orvalis::cli
