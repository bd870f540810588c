// The lead-in of a recording: 0.6 s of noise from which the channel-energy detector learns before
// the first word, made of the quietest 100 ms played forwards and backwards.
#pragma once

#include <cstdint>

namespace orvalis {

inline constexpr int32_t kLeadInWindow = 10;    // frames of 10 ms
inline constexpr int32_t kLeadInFrames = 60;    // more than the detector's initial noise frames
inline constexpr int32_t kLeadInSearch = 1000;  // searched for the window

/// The quietest window of successive frames without null audio: the one of minimum variance, the
/// earliest if there are several. Null if there is none.
const int16_t *quietest_window(const int16_t *pcm, int32_t frames, int32_t frame_samples);

/// Writes frame `number` of the lead-in: the window forwards, backwards, forwards and so on.
void make_lead_in_frame(const int16_t *window, int32_t frame_samples, int32_t number,
                        int16_t *frame);

}  // namespace orvalis
