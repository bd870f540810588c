// The EPD instance: the record of one detector, and the driver that screens, scales and suppresses
// a caller's buffer and decides on it, frame by frame.
#pragma once

#include <cstdio>

#include "Voice_Engine/epd/kepd.h"
#include "Voice_Engine/epd/velmora_vad.h"
#include "Voice_Engine/ns/s1chns.h"

/// The state of one end-point detector. All zero but for what creation sets.
struct EpdInstance {
  orvalis::Word32 pcmDumpEnabled;      ///< dump files are written only when this is 1
  orvalis::Word32 epdMode;             ///< sub-mode, 0..3
  orvalis::Word32 rateMode;            ///< 0 is 16 kHz, any other 8 kHz
  std::FILE *inputDumpFile;            ///< frames before suppression, or null
  std::FILE *resultDumpFile;           ///< the decisions, or null
  orvalis::Word32 hangLogEnabled;      ///< 0 between setLogging and the next reset
  orvalis::Word32 inputGainMode;       ///< 1 divides by 4, 2 multiplies by 4
  orvalis::Word32 processedSamples;    ///< since creation, null frames included; saturates
  orvalis::Word16 abnormalCheckCount;  ///< settling counter, 0..3
  orvalis::Word32 HANGframe;           ///< frames since the last speech; -1 in speech
  orvalis::KepdState kepd;
  orvalis::NoiseFloorState noise_floor;
  orvalis::S1chnsState suppressor;
  orvalis::S1chnsState secondary_suppressor;  ///< prepared by mode 4, not used
  orvalis::VelmoraVadState vad;
};

namespace orvalis {

/// Creates an instance; null if memory runs out. Modes: see orvalis.h.
EpdInstance *EPD_Create(Word32 mode, Word32 pcmDumpEnabled);

/// Decides on a buffer of whole frames: 1 if the decision on one was speech or end of speech, else
/// 0; 0 without counting the samples if the buffer ends in a partial frame; -1 for a null instance.
/// `reasons` are those of the last frame that was no null audio.
Word32 EPD_Proc_Frame(EpdInstance *epd, const Word16 *pcm, Word32 numSample, Word32 contentType,
                      EpdReasons &reasons);

/// Drops the open utterance and turns hangover lines on. Returns 0, or -1 for a null instance.
Word32 reset_ALL_EPDparams(EpdInstance *epd);

/// Turns hangover lines off until the next reset. Returns 0. The instance must not be null.
Word32 changeLogSetting(EpdInstance *epd);

/// Releases an instance. Returns 0, or -1 for a null or an all-ones handle.
Word32 freeMemory_EPD(EpdInstance *epd);

}  // namespace orvalis
