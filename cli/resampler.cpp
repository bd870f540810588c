#include "cli/resampler.h"

#include <samplerate.h>

#include <array>
#include <stdexcept>

namespace orvalis::cli {

Resampler::Resampler(int from_hz, int to_hz) : ratio_(static_cast<double>(to_hz) / from_hz) {
  // Medium already keeps its errors 20 dB below the steps of 16 bits, at a third of best's cost.
  int error = 0;
  state_.reset(src_new(SRC_SINC_MEDIUM_QUALITY, 1, &error));
  if (!state_) throw std::runtime_error(src_strerror(error));
}

void Resampler::Deleter::operator()(SRC_STATE_tag *state) const { src_delete(state); }

void Resampler::process(std::span<const float> input, bool last, std::vector<float> &output) {
  std::array<float, 1024> piece;
  SRC_DATA step{};
  step.src_ratio = ratio_;
  step.end_of_input = last;
  step.data_out = piece.data();
  step.output_frames = static_cast<long>(piece.size());
  do {
    step.data_in = input.data();
    step.input_frames = static_cast<long>(input.size());
    if (const int error = src_process(state_.get(), &step))
      throw std::runtime_error(src_strerror(error));
    input = input.subspan(static_cast<std::size_t>(step.input_frames_used));
    output.insert(output.end(), piece.begin(), piece.begin() + step.output_frames_gen);
  } while (step.output_frames_gen > 0 || !input.empty());
}

}  // namespace orvalis::cli
