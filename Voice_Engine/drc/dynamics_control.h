// Envelope-based dynamics control: levels recorded speech at 16 kHz, frames of 160 samples, in
// place.
//
// The peak of a frame looks up a target gain, from +12 dB for quiet audio to 0 dB at full scale;
// the gain follows it sample by sample, up within 12.5 ms and down within 0.2 s.
#pragma once

#include "Voice_Engine/basic_op/flags.h"

/// The state of one dynamics control. All zero but for what creation sets.
struct DrcInstance {
  orvalis::Word32 firstCallLogged;   ///< 0 until the first frame has logged its line
  orvalis::Word32 pcmDumpEnabled;    ///< dump files are written only when this is 1
  orvalis::Word16 loudRingIndex;     ///< slot of the newest frame, 0..9
  orvalis::Word16 loudRing[10];      ///< loud samples of the last ten frames
  orvalis::Word32 samplingRate;      ///< only 16000 is processed
  orvalis::Word16 frameLength;       ///< 160 at 16000 Hz, else 80
  orvalis::Word32 gainEnvelope;      ///< smoothed gain, its high half Q11
  orvalis::Word16 outputScale;       ///< Q15, on the gain
  orvalis::Word16 riseCoefficient;   ///< Q15 a sample, towards a larger gain
  orvalis::Word16 fallCoefficient;   ///< Q15 a sample, towards a smaller one
  const orvalis::Word16 *gainCurve;  ///< 64 gains, Q11, by the peak
};

namespace orvalis {

/// Creates an instance with the output at full scale; null if memory runs out.
DrcInstance *create_drc(Word32 samplingRate, Word32 pcmDumpEnabled);

/// Creates an instance for a frame length and an output scale in Q15; null if memory runs out.
DrcInstance *initRecDynamicsControlParameter(Word32 samplingRate, Word16 frameLength,
                                             Word16 outputScale, Word32 pcmDumpEnabled);

/// Levels whole frames; a partial last one is read and written whole. 1 if one was loud, else 0,
/// also for a count below 1; -1 for a null instance.
Word32 process_drc(DrcInstance *drc, Word16 *pcm, Word32 count);

/// Levels one frame of frameLength samples. 1 if more than 100 of the last ten frames' samples, the
/// newest frame counted twice, exceed 8192; else 0. -1, with nothing done, for a null instance or a
/// rate other than 16000.
Word32 EnvBasedDynamicsControl(Flags &flags, DrcInstance *drc, Word16 *frame);

/// Moves the gain with the peak of a frame, and applies it. Returns how many samples of the input
/// have a magnitude above 8192.
Word16 level_frame(Flags &flags, DrcInstance &drc, Word16 *frame);

/// Releases an instance. Returns 0, or -1 for a null or an all-ones handle.
Word32 freeMemory_DRC(DrcInstance *drc);

}  // namespace orvalis
