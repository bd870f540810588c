// One input through a voice detector into a report.
#pragma once

#include <utterance_stream.h>

#include <cstdint>
#include <string>

#include "cli/detector_stage.h"
#include "cli/open_audio.h"
#include "cli/report.h"
#include "cli/work_files.h"

namespace orvalis::cli {

struct DetectionSettings {
  AudioSettings audio;
  UtteranceSettings detector = UTTERANCE_SETTINGS_DEFAULT;
  // For the MCRA detector. Shorter silence joins what is before and after it.
  McraSettings mcra = MCRA_SETTINGS_DEFAULT;
  std::int32_t min_silence_ms = 300;
  Reported reported = Reported::kUtterances;
  SplitSettings split;
};

/// Reports what is found in an input while it is read. Throws AudioError or OutputError, after what
/// could be decided.
void detect(const std::string &name, const DetectionSettings &settings, Report &report,
            const Advanced &advanced);

}  // namespace orvalis::cli
