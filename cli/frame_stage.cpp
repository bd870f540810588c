#include "cli/frame_stage.h"

#include <algorithm>

namespace orvalis::cli {
namespace {

/// What lies before the next frame is kept that long: for the delay, and to be mirrored at the end,
/// when up to two frames have to be filled.
constexpr std::size_t kPast = 2 * kFrameSamples;

}  // namespace

void FrameStage::push(std::span<const std::int16_t> input, std::vector<std::int16_t> &output) {
  input_.insert(input_.end(), input.begin(), input.end());
  held_back_ += frames_in(input.size());
  while (frames_in(input_.size()) >= next_ + kFrameSamples) work_on_next(output);
}

void FrameStage::flush(std::vector<std::int16_t> &output) {
  const std::vector<std::int16_t> heard = input_;
  const std::size_t length = frames_in(heard.size());
  // Audio shorter than what is to be filled is mirrored to and fro.
  for (std::size_t i = 0; held_back_ > 0; ++i) {
    const std::size_t at = i % (2 * length);
    const std::size_t from = at < length ? length - 1 - at : at - length;
    const auto first = heard.begin() + static_cast<std::ptrdiff_t>(from * channels_);
    input_.insert(input_.end(), first, first + static_cast<std::ptrdiff_t>(channels_));
    if (frames_in(input_.size()) == next_ + kFrameSamples) work_on_next(output);
  }
}

void FrameStage::work_on_next(std::vector<std::int16_t> &output) {
  std::array<std::int16_t, kFrameSamples> frame{};
  for (std::size_t i = 0; i < kFrameSamples; ++i)
    if (next_ + i >= delay_) frame[i] = input_[(next_ + i - delay_) * channels_];
  work(std::span(input_).subspan(next_ * channels_, kFrameSamples * channels_), frame);

  const std::size_t skipped = std::min(to_skip_, kFrameSamples);
  const std::size_t given = std::min(kFrameSamples - skipped, held_back_);
  output.insert(output.end(), frame.begin() + skipped, frame.begin() + skipped + given);
  to_skip_ -= skipped;
  held_back_ -= given;

  next_ += kFrameSamples;
  const std::size_t forgotten = next_ > kPast ? next_ - kPast : 0;
  input_.erase(input_.begin(), input_.begin() + static_cast<std::ptrdiff_t>(forgotten * channels_));
  next_ -= forgotten;
}

}  // namespace orvalis::cli
