// Where processed audio goes: a file that is there whole or not at all, or a stream.
#pragma once

#include <cstdint>
#include <memory>
#include <span>
#include <string>

namespace orvalis::cli {

/// Whether an output of that name is written as the audio comes: "-" is standard output, and a pipe
/// or a device has no name to take late.
bool is_streamed(const std::string &name);

/// Formats that can be streamed.
bool can_be_streamed(const std::string &format);

/// Frees standard output for audio: what is printed goes to standard error from now on.
void reserve_standard_output();

/// Takes one channel of 16-bit samples. Methods throw OutputError, or std::system_error if standard
/// output fails, which ends the tool.
class AudioOutput {
public:
  virtual ~AudioOutput() = default;
  virtual void write(std::span<const std::int16_t> samples) = 0;
  /// All of the audio was written. A file appears under its name.
  virtual void commit() = 0;
};

/// Opens an output in one of output_format_names. `replace`: a file of that name gives way.
std::unique_ptr<AudioOutput> open_audio_output(const std::string &name, const std::string &format,
                                               int rate_hz, bool replace);

}  // namespace orvalis::cli
