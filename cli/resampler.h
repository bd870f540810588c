// Audio from one sampling rate to another, piece by piece.
#pragma once

#include <memory>
#include <span>
#include <vector>

struct SRC_STATE_tag;

namespace orvalis::cli {

class Resampler {
public:
  Resampler(int from_hz, int to_hz, int channels = 1);

  /// Appends to `output` what can be said after `input`; `last` also draws out the filter's tail.
  void process(std::span<const float> input, bool last, std::vector<float> &output);

private:
  struct Deleter {
    void operator()(SRC_STATE_tag *state) const;
  };

  std::unique_ptr<SRC_STATE_tag, Deleter> state_;
  double ratio_;
  std::size_t channels_;
};

}  // namespace orvalis::cli
