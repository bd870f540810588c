// Conversion of the sampling rate, chunk by chunk, and of floating point to 16 bits.
#pragma once

#include <cstdint>
#include <memory>
#include <span>
#include <vector>

struct SRC_STATE_tag;

namespace orvalis::cli {

/// Full scale is 32768; rounds to nearest and clips. NaN becomes 0.
std::int16_t to_word16(float sample);

class Resampler {
public:
  Resampler(int from_hz, int to_hz, int channels = 1);

  /// Appends to `output` the samples that are ready; `last` also flushes the filter's tail.
  void process(std::span<const float> input, bool last, std::vector<float> &output);

private:
  struct Deleter {
    void operator()(SRC_STATE_tag *state) const;
  };

  std::unique_ptr<SRC_STATE_tag, Deleter> state_;
  double ratio_;
  std::size_t channels_;
};

/// One channel of 16 bits, to a length that is known at the end.
class Resampler16 {
public:
  Resampler16(int from_hz, int to_hz) : resampler_(from_hz, to_hz) {}

  /// Appends the samples that are ready.
  void push(std::span<const std::int16_t> input, std::vector<std::int16_t> &output);

  /// Appends the rest, cut or extended so that the whole output has `length` samples: the filter
  /// alone misses that by one or two.
  void flush(std::int64_t length, std::vector<std::int16_t> &output);

private:
  void append(std::vector<std::int16_t> &output);

  Resampler resampler_;
  std::int64_t count_ = 0;
  std::vector<float> in_, out_;
};

}  // namespace orvalis::cli
