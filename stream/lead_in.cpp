#include "stream/lead_in.h"

#include <algorithm>

#include "Voice_Engine/channel/frame_screening.h"

namespace orvalis {
namespace {

/// Sums over the samples of a frame. Over a window they stay below 2^41, its scaled variance below
/// 2^52.
struct Sums {
  int64_t linear = 0;
  int64_t squared = 0;
};

Sums sums_of(const int16_t *frame, int32_t samples) {
  Sums sums;
  for (int32_t i = 0; i < samples; ++i) {
    sums.linear += frame[i];
    sums.squared += int64_t{frame[i]} * frame[i];
  }
  return sums;
}

/// The variance of a window, times the square of its length.
int64_t scaled_variance(const Sums (&frames)[kLeadInWindow], int32_t frame_samples) {
  Sums sums;
  for (const Sums &frame : frames) {
    sums.linear += frame.linear;
    sums.squared += frame.squared;
  }
  return kLeadInWindow * frame_samples * sums.squared - sums.linear * sums.linear;
}

}  // namespace

const int16_t *quietest_window(const int16_t *pcm, int32_t frames, int32_t frame_samples) {
  const int16_t *quietest = nullptr;
  int64_t min_variance = 0;
  Sums window[kLeadInWindow];  // ring of the latest frames
  int32_t run = 0;             // of frames without null audio
  for (int32_t i = 0; i < frames; ++i) {
    const int16_t *frame = pcm + i * frame_samples;
    window[i % kLeadInWindow] = sums_of(frame, frame_samples);
    int32_t small_samples = 0;
    run = is_null_frame(frame, frame_samples, small_samples) ? 0 : run + 1;
    if (run < kLeadInWindow) continue;
    const int64_t variance = scaled_variance(window, frame_samples);
    if (quietest != nullptr && variance >= min_variance) continue;
    min_variance = variance;
    quietest = frame - (kLeadInWindow - 1) * frame_samples;
  }
  return quietest;
}

void make_lead_in_frame(const int16_t *window, int32_t frame_samples, int32_t number,
                        int16_t *frame) {
  const int32_t at = number % kLeadInWindow;
  const bool is_backwards = number / kLeadInWindow % 2 != 0;
  if (is_backwards) {
    const int16_t *mirrored = window + (kLeadInWindow - 1 - at) * frame_samples;
    std::reverse_copy(mirrored, mirrored + frame_samples, frame);
  } else {
    std::copy_n(window + at * frame_samples, frame_samples, frame);
  }
}

}  // namespace orvalis
