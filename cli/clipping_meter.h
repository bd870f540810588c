// A stage that changes nothing and counts the samples at full scale.
#pragma once

#include "cli/occurrences.h"
#include "cli/stage.h"

namespace orvalis::cli {

class ClippingMeter : public Stage {
public:
  /// `clipped` outlives the stage.
  ClippingMeter(std::size_t channels, Occurrences &clipped)
      : channels_(static_cast<std::int64_t>(channels)), clipped_(clipped) {}

  void push(std::span<const std::int16_t> input, std::vector<std::int16_t> &output) override {
    for (const std::int16_t sample : input) {
      if (sample == INT16_MAX || sample == INT16_MIN) clipped_.note(values_ / channels_);
      ++values_;
    }
    output.insert(output.end(), input.begin(), input.end());
  }
  void flush(std::vector<std::int16_t> &) override {}

private:
  std::int64_t channels_;
  std::int64_t values_ = 0;
  Occurrences &clipped_;
};

}  // namespace orvalis::cli
