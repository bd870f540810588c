// One input through suppression and dynamics control into one output.
#pragma once

#include <enhancement_stream.h>

#include "cli/audio_output.h"
#include "cli/detect.h"

namespace orvalis::cli {

struct EnhanceSettings {
  AudioSettings audio;
  EnhancementSettings enhancement = ENHANCEMENT_SETTINGS_DEFAULT;
  bool detect = false;  ///< Report the utterances of the result
  DetectorSettings detector;
  double headroom_db = 0;  ///< The input is scaled down by this before anything else
  bool keep_rate = false;  ///< Convert the result back to the input's rate
  OutputRules rules;
};

/// Writes the output while the job's input is read. `report` gets the utterances, if wanted; what
/// else the user should know is printed as notes. Throws AudioError.
void enhance(Job &job, const OutputTarget &target, const EnhanceSettings &settings, Report &report);

}  // namespace orvalis::cli
