// One input through the end-point detector into a report.
#pragma once

#include <utterance_stream.h>

#include <functional>
#include <string>

#include "cli/open_audio.h"
#include "cli/progress.h"
#include "cli/report.h"

namespace orvalis::cli {

struct DetectionSettings {
  AudioSettings audio;
  UtteranceSettings detector = UTTERANCE_SETTINGS_DEFAULT;
  bool frames = false;       ///< Answers to frames instead of utterances
  std::string split_folder;  ///< Each utterance goes to a file of its own here; "" for none
  bool replace = false;      ///< Files that are there already give way to those
};

/// Reports what is found in an input while it is read; `advanced` hears after every piece how far
/// that is. Throws AudioError or OutputError, after what could be decided.
void detect(const std::string &name, const DetectionSettings &settings, Report &report,
            const std::function<void(const Advance &)> &advanced);

}  // namespace orvalis::cli
