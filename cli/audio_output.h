// Where processed audio goes: a file that appears once it is complete, or a stream.
#pragma once

#include <cstdint>
#include <memory>
#include <span>
#include <string>
#include <vector>

#include "cli/output_file.h"

namespace orvalis::cli {

/// Names of the formats that can be written, for --format.
std::vector<std::string> output_format_names();

/// The format that a file's name ends in: one of output_format_names, or "".
std::string format_of_name(const std::string &file);

/// Whether an output of that name is written while the audio arrives: "-" is standard output, and a
/// pipe or device cannot be renamed when it is complete.
bool is_streamed(const std::string &name);

/// Whether a format can be streamed.
bool can_be_streamed(const std::string &format);

struct OutputTarget {
  std::string name;          ///< "-" for standard output
  std::string format;        ///< One of output_format_names
  int standard_output = -1;  ///< Its descriptor, for "-"
};

/// Takes one channel of 16-bit samples. All methods throw AudioError, or std::system_error if
/// standard output fails, which ends the tool.
class AudioOutput {
public:
  virtual ~AudioOutput() = default;
  virtual void write(std::span<const std::int16_t> samples) = 0;
  /// All audio has been written: a file now appears under its name.
  virtual void commit() = 0;
};

std::unique_ptr<AudioOutput> open_audio_output(const OutputTarget &target, int rate_hz,
                                               const OutputRules &rules);

}  // namespace orvalis::cli
