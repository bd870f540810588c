// What both frame drivers check before they process a frame: null audio is skipped, and suppression
// waits until the level of the input has settled.
#pragma once

#include "Voice_Engine/basic_op/word.h"
#include "Voice_Engine/platform/log.h"

namespace orvalis {

/// Whether a frame, of a multiple of 16 samples, holds more than 60 zeros in a row. Non-zero
/// samples of magnitude up to 4 are added to `small_samples`; the scan ends with the 61st zero.
bool is_null_frame(const Word16 *frame, int samples, Word32 &small_samples);

/// What a driver logs while suppression waits.
struct SettlingTexts {
  const char *abnormal;
  const char *waiting;
};

/// Value of the settling counter from which audio counts as settled for good.
inline constexpr Word16 kSettled = 3;

/// Samples after which audio counts as settled whatever it holds.
inline constexpr Word32 kSettlingSamples = 3200;

/// Decides whether the audio has settled, and moves the counter: settled at once if the very first
/// frame is normal, else after three normal frames in a row. `running` counts the samples of the
/// instance up to the end of this frame.
inline bool audio_settled(Word16 &abnormal_check_count, Word32 running, int frame_samples,
                          bool is_normal, const SettlingTexts &texts) {
  const bool is_first = running == frame_samples;
  if ((is_first && is_normal) || running >= kSettlingSamples || abnormal_check_count >= kSettled) {
    abnormal_check_count = kSettled;
    return true;
  }
  log_line(kLogDebug, kLogTag, "%s", is_normal ? texts.waiting : texts.abnormal);
  abnormal_check_count = static_cast<Word16>(is_normal ? abnormal_check_count + 1 : 0);
  return false;
}

}  // namespace orvalis
