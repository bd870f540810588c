// The decision on a frame, from its energies and from the sum of p over its bins.
#pragma once

#include "Voice_Engine/MCRAvad/MCRAvad.h"

namespace orvalis {

/// Whether an analysed frame is speech. `exponent` applies to a threshold under calibration.
bool decide_frame(VADINFO &vad, float exponent);

/// The same decision again, with both sides of its conditions. `reasons` hold those of the previous
/// frame.
bool explain_frame(const VADINFO &vad, McraReasons &reasons);

}  // namespace orvalis
