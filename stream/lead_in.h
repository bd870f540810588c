// What the channel-energy detector may hear ahead of a recording that begins with speech, for it
// learns the noise first: the quietest 100 ms, played back and forth for 0.6 s.
#pragma once

#include <cstdint>

namespace orvalis {

inline constexpr int32_t kLeadInWindow = 10;    // frames of 10 ms
inline constexpr int32_t kLeadInFrames = 60;    // that are played, beyond those never answered
inline constexpr int32_t kLeadInSearch = 1000;  // among which the window is sought

/// The quietest window of successive frames without null audio: that of least variance, the
/// earliest of several. Null if there is none.
const int16_t *quietest_window(const int16_t *pcm, int32_t frames, int32_t frame_samples);

/// Writes frame `number` of the lead-in: the window forwards, backwards, forwards and so on.
void make_lead_in_frame(const int16_t *window, int32_t frame_samples, int32_t number,
                        int16_t *frame);

}  // namespace orvalis
