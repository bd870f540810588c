// The noise in every bin, by minima-controlled recursive averaging (MCRA).
//
// Symbols of the papers: |Y|^2 periodogram, S_f and S its smoothing over bins and time, S_min the
// minimum of S, I the indicator of speech, p' its average, lambda_d the noise. S_tmp has no
// counterpart: where the papers restart it, here is a ring of the last 20 spectra of S.
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

/// |Y|^2 of the windowed frame. The window is applied in the caller's buffer, to its first `length`
/// samples; 160 are transformed.
void compute_periodogram(VADINFO &vad, Word16 *frame, Word32 length);

/// Updates S_f, S, S_min and lambda_d from the periodogram.
void update_noise(VADINFO &vad);

}  // namespace orvalis
