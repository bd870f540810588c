// Each utterance in a file of its own, a part of the input: take-001.wav, take-002.wav ... of
// take.wav.
#pragma once

#include <utterance_stream.h>

#include <cstdint>
#include <memory>
#include <span>
#include <string>
#include <vector>

#include "cli/audio_source.h"
#include "cli/output_file.h"

namespace orvalis::cli {

struct SplitSettings {
  std::string folder;  ///< "" for no files
  OutputRules rules;
};

/// Writes the utterances of one input.
class Split {
public:
  virtual ~Split() = default;

  /// The audio that the detector gets, in order.
  virtual void push(std::span<const std::int16_t> samples) = 0;
  /// No utterance that is still to be written starts before `sample`.
  virtual void forget_before(std::int64_t sample) = 0;
  /// Utterances come in order and do not overlap. Throws AudioError.
  virtual void write(const Utterance &found) = 0;
};

/// Two inputs whose parts would have the same names, as "a and b"; "" if there are none.
std::string same_parts(const std::vector<std::string> &inputs);

/// Whether a part of `input` may get that name.
bool is_part_of(const std::string &input, const std::string &name);

/// Copies the input's own samples, with its rate, channels and sample format, or in floating point
/// if it is lossily compressed. An input that can be read only once is treated as by
/// split_processed. Null if the settings ask for no files. Throws AudioError.
std::unique_ptr<Split> split_source(const SplitSettings &settings, const std::string &input,
                                    const AudioSettings &audio, int engine_rate_hz);

/// Writes the audio that the detector gets. Null if the settings ask for no files.
std::unique_ptr<Split> split_processed(const SplitSettings &settings, const std::string &input,
                                       int rate_hz);

}  // namespace orvalis::cli
