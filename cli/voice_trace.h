// Why the MCRA detector answered a frame as it did.
#pragma once

#include <MCRAvad.h>

#include "cli/trace.h"

namespace orvalis::cli {

/// Follows a record from its initial state on.
class VoiceTrace {
public:
  /// What led to the answer to the record's frame. Energies and bins are those of the frame and its
  /// predecessor; speech is what exceeds both thresholds and has more than 40 bins.
  Trace of_frame(const VADINFO &vad, bool speech);

private:
  float smoothed_threshold(const VADINFO &vad) const;

  float last_energy_ = 0;
  float last_smoothed_energy_ = 0;
  float last_minimum_energy_ = 0;
  std::int64_t last_bins_ = 0;
};

}  // namespace orvalis::cli
