// Whole frames of 10 ms at 16 kHz from audio in chunks of any size.
#pragma once

#include <algorithm>
#include <cstdint>

namespace orvalis {

inline constexpr std::int32_t kFrame = 160;  ///< samples a channel

/// One channel, or two interleaved ones. "Samples" count one channel, "values" all of them.
class FrameCutter {
public:
  explicit FrameCutter(std::int32_t channels) : channels_(channels) {}

  std::int32_t frame_values() const { return kFrame * channels_; }

  /// Values of the incomplete frame.
  std::int32_t waiting_values() const { return waiting_; }

  /// Calls work(frame) for each frame that the values complete. The two frames before it are in
  /// front of it in memory; at the beginning these are zeros.
  template <class Work>
  void push(const std::int16_t *samples, std::int32_t values, Work work) {
    while (values > 0) {
      const std::int32_t chunk = std::min(values, frame_values() - waiting_);
      std::copy_n(samples, chunk, frame() + waiting_);
      samples += chunk;
      values -= chunk;
      waiting_ += chunk;
      if (waiting_ == frame_values()) finish_frame(work);
    }
  }

  /// Completes `frames` frames with the end of the audio mirrored, forth and back if it is short.
  /// There must have been audio, and as much of either channel.
  template <class Work>
  void flush(std::int32_t frames, Work work) {
    std::int16_t tail[kMaxValues];
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
  static constexpr std::int32_t kMaxChannels = 2;
  static constexpr std::int32_t kMaxValues = 3 * kFrame * kMaxChannels;

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
  std::int32_t past_ = 0;  // values of audio in front of the frame
  std::int32_t waiting_ = 0;
  std::int16_t audio_[kMaxValues] = {};  // two past frames, and the incomplete one
};

}  // namespace orvalis
