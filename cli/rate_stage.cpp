#include "cli/rate_stage.h"

#include <algorithm>

#include "cli/word16.h"

namespace orvalis::cli {

void RateStage::push(std::span<const std::int16_t> input, std::vector<std::int16_t> &output) {
  resample(input, false, output);
}

void RateStage::flush(std::vector<std::int16_t> &output) { resample({}, true, output); }

void RateStage::resample(std::span<const std::int16_t> input, bool last,
                         std::vector<std::int16_t> &output) {
  in_.resize(input.size());
  std::ranges::transform(input, in_.begin(),
                         [](std::int16_t sample) { return static_cast<float>(sample) / 32768; });
  out_.clear();
  resampler_.process(in_, last, out_);
  // The filter's tail is longer than what may be too much.
  if (last)
    out_.resize(static_cast<std::size_t>(std::max<std::int64_t>(0, length_() - given_)),
                out_.empty() ? 0.0F : out_.back());
  given_ += static_cast<std::int64_t>(out_.size());
  std::ranges::transform(out_, std::back_inserter(output), to_word16);
}

}  // namespace orvalis::cli
