// The MCRA detector behind its exported entries, for callers inside the library.
#pragma once

#include "Voice_Engine/MCRAvad/MCRAvad.h"
#include "Voice_Engine/basic_op/word.h"

namespace orvalis {

/// As initialVADINFO.
void initialise_mcra(VADINFO &vad);

/// As ApplyVAD: windows `frame` in place.
void analyse_mcra_frame(VADINFO &vad, Word16 *frame, Word32 length);

/// As processVAD: windows the frame in place; true for speech.
bool process_mcra_frame(VADINFO &vad, Word16 *frame, Word32 length, float exponent);

}  // namespace orvalis
