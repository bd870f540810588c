// End-point decision (KEPD) and noise-floor tracking: from voice or no voice in each frame to no
// speech, speech or end of speech.
#pragma once

#include <cstdint>

#include "Voice_Engine/basic_op/flags.h"
#include "Voice_Engine/epd/epd_reasons.h"

struct EpdInstance;

namespace orvalis {

/// Decisions of KEPDfunc.
inline constexpr Word32 kNoSpeech = 0;
inline constexpr Word32 kSpeech = 1;
inline constexpr Word32 kEndOfSpeech = 2;

/// Utterances of up to so many frames are refused as too short.
inline constexpr Word32 kShortUtterance = 19;

/// When an utterance begins and ends, in frames of 10 ms.
struct KepdTiming {
  Word32 onset;        ///< voiced frames in a row that open it
  Word32 pause_limit;  ///< pause frames that close it
  Word32 end_delay;    ///< frames that closing takes; the last one is end of speech

  /// By how many frames the first and the last decision for speech are late.
  constexpr Word32 start_lag() const { return onset - 1; }
  constexpr Word32 end_lag() const { return pause_limit + end_delay - 1; }
};

/// Content types from 2 on have the short timing.
constexpr KepdTiming timing_of(std::uint32_t content_type, bool narrow_band) {
  const Word32 end_delay = narrow_band ? 4 : 1;
  return content_type < 2 ? KepdTiming{6, 25, end_delay} : KepdTiming{4, 14, end_delay};
}

/// Decision state, part of the EPD instance.
struct KepdState {
  Word32 onset_cnt;      ///< voiced frames in a row
  Word32 pause_cnt;      ///< unvoiced frames since speech was confirmed
  Word32 in_speech;      ///< 1 while an utterance is open
  Word32 long_speech;    ///< 1 once a pause has ended an utterance that was long enough
  Word32 end_cnt;        ///< frames since long_speech was set
  Word32 voiced_run;     ///< voiced frames in a row inside an utterance
  Word32 speech_frames;  ///< frames of the open utterance
  Word32 frame_cnt;      ///< frames since initialisation
  float EnergyTHscore;   ///< exponent of the detector's energy gate
};

/// Noise-floor tracking state, part of the EPD instance. Energies are mean squares / 100.
struct NoiseFloorState {
  Word32 noise_frames;       ///< non-speech frames
  Word32 speech_frames_ne;   ///< speech frames, stops at 45; 46 once KEPD has seen that
  float speech_energy;       ///< sum, in the end mean, over the first 45 speech frames
  float energy_hist[45];     ///< latest non-speech frames, oldest first
  float noise_energy;        ///< running noise floor
  float speech_noise_ratio;  ///< set once with the 45th speech frame
};

/// Clears the decision state and the detector of an instance; a sub-mode above 3 becomes 0.
/// Returns 0, or -1 for a null record.
Word32 InitKEPD(EpdInstance **handle);

/// Clears the noise-floor state. Returns 0.
Word32 InitNoiseEstimation(EpdInstance **handle);

/// The decision on a frame with or without voice; the first 39 frames never count as voice.
/// `reasons` takes the decision and the counts that led to it.
Word32 decide(KepdState &kepd, bool voiced, std::uint32_t content_type, bool narrow_band,
              EpdReasons &reasons);

/// Detects voice in one frame and decides. Returns -1 for a null record.
Word32 KEPDfunc(Flags &flags, EpdInstance **handle, const Word16 *frame, std::uint32_t type,
                EpdReasons &reasons);

/// Tracks the noise floor with the unsuppressed frame. `decision` is not used. Returns 0.
Word32 KEPDfunc_NoiseEstimation(EpdInstance **handle, const Word16 *frame, Word32 decision);

/// Drops the open utterance. Returns 0.
Word32 KEPDfunc_Reset(EpdInstance **handle);

/// Releases nothing. Returns 0.
Word32 CloseKEPD(EpdInstance **handle);

/// Mean square / 100 of 320 (mode 2), 160 (mode 0) or 80 samples.
float getAbsoluteEnergy(const Word16 *x, Word32 rateMode);

}  // namespace orvalis
