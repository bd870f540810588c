// Calibration of the energy threshold by the loudest window of the first seconds.
#pragma once

#include "Voice_Engine/MCRAvad/MCRAvad.h"

namespace orvalis {

/// Adds a frame's energy to the calibration: six windows of 90 frames, 25 frames apart. Each window
/// that closes sets the threshold to 2 x^exponent / (2^31 - 1), with x the mean energy of a frame,
/// in Q31, in the loudest window so far.
void calibrate_threshold(VADINFO &vad, float frame_energy, float exponent);

}  // namespace orvalis
