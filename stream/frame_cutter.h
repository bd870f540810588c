// Whole frames of 10 ms at 16 kHz from audio in chunks of any size.
#pragma once

#include <algorithm>
#include <cstdint>

namespace orvalis {

inline constexpr std::int32_t kFrame = 160;  ///< samples a channel

/// One channel, or two interleaved ones. Counts are of samples a channel unless they are said to be
/// of values.
class FrameCutter {
public:
  explicit FrameCutter(std::int32_t channels) : channels_(channels) {}

  std::int32_t frame_values() const { return kFrame * channels_; }

  /// Values of the frame that is not whole yet.
  std::int32_t waiting_values() const { return waiting_; }

  /// Calls work(frame) for each frame that the values complete. In front of it stands the audio
  /// before it, as far back as two frames, and zeros before the first of all.
  template <class Work>
  void push(const std::int16_t *samples, std::int32_t values, Work work) {
    while (values > 0) {
      const std::int32_t piece = std::min(values, frame_values() - waiting_);
      std::copy_n(samples, piece, frame() + waiting_);
      samples += piece;
      values -= piece;
      waiting_ += piece;
      if (waiting_ == frame_values()) finish_frame(work);
    }
  }

  /// Completes as many frames with the last audio mirrored, to and fro where it is short. There
  /// must have been some, and no channel may be ahead of the other.
  template <class Work>
  void flush(std::int32_t frames, Work work) {
    std::int16_t tail[kMostValues];
    const std::int32_t length = (past_ + waiting_) / channels_;
    std::copy_n(frame() - past_, past_ + waiting_, tail);
    const std::int32_t missing = frames * kFrame - waiting_ / channels_;
    for (std::int32_t i = 0; i < missing; ++i) {
      const std::int32_t step = i % (2 * length);
      const std::int32_t from = step < length ? length - 1 - step : step - length;
      push(tail + from * channels_, channels_, work);
    }
  }

private:
  static constexpr std::int32_t kMostChannels = 2;
  static constexpr std::int32_t kMostValues = 3 * kFrame * kMostChannels;

  std::int16_t *frame() { return audio_ + 2 * frame_values(); }

  template <class Work>
  void finish_frame(Work work) {
    const std::int16_t *whole = frame();
    work(whole);
    std::copy_n(audio_ + frame_values(), 2 * frame_values(), audio_);
    past_ = std::min(past_ + frame_values(), 2 * frame_values());
    waiting_ = 0;
  }

  std::int32_t channels_;
  std::int32_t past_ = 0;  // values in front of the frame that are audio
  std::int32_t waiting_ = 0;
  std::int16_t audio_[kMostValues] = {};  // two frames of the past, and the one that is filled
};

}  // namespace orvalis
