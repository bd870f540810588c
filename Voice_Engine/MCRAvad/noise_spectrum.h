// The noise in every bin, by minima-controlled recursive averaging.
//
// Source: I. Cohen, "Noise spectrum estimation in adverse environments: improved minima controlled
// recursive averaging", IEEE Transactions on Speech and Audio Processing, 2003; I. Cohen and B.
// Berdugo, "Noise estimation by minima controlled recursive averaging for robust speech
// enhancement", IEEE Signal Processing Letters, 2002.
#pragma once

#include "Voice_Engine/MCRAvad/MCRAvad.h"
#include "Voice_Engine/basic_op/word.h"

namespace orvalis {

inline constexpr int kMcraBins = MCRA_BINS;

/// Powers of the windowed frame's bins. The window is applied in the caller's buffer, to its first
/// `length` samples; 160 are transformed.
void take_periodogram(VADINFO &vad, Word16 *frame, Word32 length);

/// Takes the periodogram into the smoothed powers, their minima and the noise.
void update_noise(VADINFO &vad);

}  // namespace orvalis
