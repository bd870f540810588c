// A stage for what works on whole frames of 10 ms at 16 kHz, and may delay.
#pragma once

#include <array>

#include "cli/stage.h"

namespace orvalis::cli {

inline constexpr std::size_t kFrameSamples = 160;

/// Takes one channel or interleaved ones, and gives one. The output is as long as the input: a
/// short last frame is filled up, and what a delay holds back drawn out, with the last samples
/// mirrored. Zeros would be null audio to the engine, and no speech ends so abruptly.
class FrameStage : public Stage {
public:
  void push(std::span<const std::int16_t> input, std::vector<std::int16_t> &output) override;
  void flush(std::vector<std::int16_t> &output) override;

protected:
  using OutputFrame = std::span<std::int16_t, kFrameSamples>;

  /// `delay` is that of the work, a frame at most, for which an aligned stage makes up.
  FrameStage(std::size_t channels, std::size_t delay, bool aligned)
      : channels_(channels), delay_(delay), to_skip_(aligned ? delay : 0) {}

  /// Works on a frame. `output` holds the first channel, delayed: what is to come out where nothing
  /// is done.
  virtual void work(std::span<const std::int16_t> input, OutputFrame output) = 0;

private:
  void work_on_next(std::vector<std::int16_t> &output);
  std::size_t frames_in(std::size_t values) const { return values / channels_; }

  std::size_t channels_, delay_;
  std::size_t to_skip_;        // samples of the output that are the delay
  std::size_t held_back_ = 0;  // samples of the input that have not come out yet
  std::vector<std::int16_t> input_;
  std::size_t next_ = 0;  // where in input_, in samples a channel, the next frame begins
};

}  // namespace orvalis::cli
