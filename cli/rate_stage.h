// Back from 16 kHz to the rate that the audio had.
#pragma once

#include <functional>
#include <optional>

#include "cli/resampler.h"
#include "cli/stage.h"

namespace orvalis::cli {

class RateStage : public Stage {
public:
  /// `length` tells at the end how many samples the output has to have: resampling to and fro knows
  /// it to a sample or two.
  RateStage(int rate_hz, std::function<std::int64_t()> length)
      : resampler_(16000, rate_hz), length_(std::move(length)) {}

  void push(std::span<const std::int16_t> input, std::vector<std::int16_t> &output) override;
  void flush(std::vector<std::int16_t> &output) override;

private:
  void resample(std::span<const std::int16_t> input, bool last, std::vector<std::int16_t> &output);

  Resampler resampler_;
  std::function<std::int64_t()> length_;
  std::int64_t given_ = 0;
  std::vector<float> in_, out_;
};

}  // namespace orvalis::cli
