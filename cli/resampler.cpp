#include "cli/resampler.h"

#include <samplerate.h>

#include <array>
#include <stdexcept>

namespace orvalis::cli {

Resampler::Resampler(int from_hz, int to_hz, int channels)
    : ratio_(static_cast<double>(to_hz) / from_hz), channels_(static_cast<std::size_t>(channels)) {
  // Medium already keeps its errors 20 dB below the steps of 16 bits, at a third of best's cost.
  int error = 0;
  state_.reset(src_new(SRC_SINC_MEDIUM_QUALITY, channels, &error));
  if (!state_) throw std::runtime_error(src_strerror(error));
}

void Resampler::Deleter::operator()(SRC_STATE_tag *state) const { src_delete(state); }

void Resampler::process(std::span<const float> input, bool last, std::vector<float> &output) {
  std::array<float, 1024> piece;
  SRC_DATA step{};
  step.src_ratio = ratio_;
  step.end_of_input = last;
  step.data_out = piece.data();
  step.output_frames = static_cast<long>(piece.size() / channels_);
  do {
    step.data_in = input.data();
    step.input_frames = static_cast<long>(input.size() / channels_);
    if (const int error = src_process(state_.get(), &step))
      throw std::runtime_error(src_strerror(error));
    input = input.subspan(static_cast<std::size_t>(step.input_frames_used) * channels_);
    output.insert(
        output.end(), piece.begin(),
        piece.begin() + static_cast<std::ptrdiff_t>(
                            static_cast<std::size_t>(step.output_frames_gen) * channels_));
  } while (step.output_frames_gen > 0 || !input.empty());
}

}  // namespace orvalis::cli
