// The probability of speech in every bin, from its SNR and that of its surroundings.
//
// Symbols of the papers: gamma a posteriori SNR, xi a priori SNR, v = gamma xi / (1 + xi), G gain,
// zeta average of xi over time, q prior probability of speech absence, p probability of speech.
//
// Source: I. Cohen and B. Berdugo, "Speech enhancement for non-stationary noise environments",
// Signal Processing, 2001; Y. Ephraim and D. Malah, "Speech enhancement using a minimum mean-square
// error log-spectral amplitude estimator", IEEE Transactions on Acoustics, Speech, and Signal
// Processing, 1985.
#pragma once

#include "Voice_Engine/MCRAvad/MCRAvad.h"

namespace orvalis {

/// gamma, xi, G, zeta and p of a frame whose noise is known.
void update_presence(VADINFO &vad);

}  // namespace orvalis
