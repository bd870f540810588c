// The energy threshold learnt from the loudest stretch of the first seconds.
#pragma once

#include "Voice_Engine/MCRAvad/MCRAvad.h"

namespace orvalis {

/// Takes a frame's energy into the calibration: windows of 90 frames, 25 frames apart. A window
/// that closes moves the threshold to 2 x^exponent / (2^31 - 1), with x the mean energy of a frame,
/// in Q31, in the loudest window so far.
void calibrate_threshold(VADINFO &vad, float frame_energy, float exponent);

}  // namespace orvalis
