// The NS instance: the record of one noise suppressor, and the driver that screens and suppresses a
// caller's buffer frame by frame.
#pragma once

#include <cstdio>

#include "Voice_Engine/ns/s1chns.h"
#include "Voice_Engine/ns/s2chns.h"

/// The state of one noise suppressor, except the record of two microphones, which belongs to the
/// caller. All zero but for what creation sets.
struct NsInstance {
  orvalis::Word32 pcmDumpEnabled;      ///< 0: no caller can ask for dump files
  orvalis::Word32 rateMode;            ///< rate digit of the mode
  orvalis::Word32 micCount;            ///< 1 or 2; others suppress nothing
  std::FILE *inputDumpFile;            ///< the input, or null
  std::FILE *resultDumpFile;           ///< the output of frames that were suppressed, or null
  orvalis::Word32 reserved;            ///< 0
  orvalis::Word32 processedSamples;    ///< since creation, skipped frames included; saturates
  orvalis::Word16 abnormalCheckCount;  ///< settling counter, 0..3
  orvalis::S1chnsState suppressor;     ///< for one microphone
};

namespace orvalis {

// `pair` is the record of two microphones: the same one in every call on an instance, not touched
// with any other number of microphones.

/// Creates an instance; null if memory runs out. Modes: see orvalis.h.
NsInstance *DoNS_Create(Word32 mode, Word32 micCount, S2chnsState &pair);

/// Suppresses a buffer of whole frames; a partial last frame is read and written whole. A frame
/// that is not suppressed leaves its part of `out` as it is. Returns the samples processed since
/// creation, or -1 for a null instance, for counts that differ, and for one microphone at 8 kHz.
Word32 DO_NS_Proc_Frame(NsInstance *ns, S2chnsState &pair, Word16 *in, Word32 numIn, Word16 *out,
                        Word32 numOut);

/// Releases an instance. Returns 0, or -1 for a null or an all-ones handle.
Word32 freeMemory_NS(NsInstance *ns);

}  // namespace orvalis
