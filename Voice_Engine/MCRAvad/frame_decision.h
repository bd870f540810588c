// Speech or not, from a frame's energies and the number of bins in which speech is likely.
#pragma once

#include "Voice_Engine/MCRAvad/MCRAvad.h"

namespace orvalis {

/// Whether an analysed frame is speech. `exponent` shapes a threshold that is being calibrated.
bool decide_frame(VADINFO &vad, float exponent);

/// The decision once more, with both sides of its conditions. `reasons` are those of the frame
/// before.
bool explain_frame(const VADINFO &vad, McraReasons &reasons);

}  // namespace orvalis
