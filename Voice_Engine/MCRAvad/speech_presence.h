// How likely speech is in every bin, from its SNR and that of its surroundings.
//
// Source: I. Cohen and B. Berdugo, "Speech enhancement for non-stationary noise environments",
// Signal Processing, 2001; Y. Ephraim and D. Malah, "Speech enhancement using a minimum mean-square
// error log-spectral amplitude estimator", IEEE Transactions on Acoustics, Speech, and Signal
// Processing, 1985.
#pragma once

#include "Voice_Engine/MCRAvad/MCRAvad.h"

namespace orvalis {

/// SNRs, gains and probabilities of a frame whose noise is known.
void update_presence(VADINFO &vad);

}  // namespace orvalis
