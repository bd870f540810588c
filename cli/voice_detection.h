// One input through the MCRA detector into a report.
#pragma once

#include <cstdint>
#include <string>

#include "cli/open_audio.h"
#include "cli/report.h"
#include "cli/work_files.h"

namespace orvalis::cli {

struct VoiceSettings {
  AudioSettings audio;
  // The detector's configuration: MCRAvad.h.
  float exponent = 0.84F;
  std::int32_t energy_margin = 2;
  bool history = false;
  bool calibrate = false;
  bool margin_over_minima = false;
  bool low_threshold = false;
  // From its answers to segments.
  int min_speech_ms = 100;
  int min_silence_ms = 300;
  int pad_before_ms = 0;
  int pad_after_ms = 0;
  bool trace = false;  ///< What led to the answer to every frame, instead of segments
};

/// Reports what is found in an input while it is read. Throws AudioError, after what could be
/// decided.
void detect_voice(const std::string &name, const VoiceSettings &settings, Report &report,
                  const Advanced &advanced);

}  // namespace orvalis::cli
