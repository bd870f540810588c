// The audio of single utterances, written to files of their own.
#pragma once

#include <cstdint>
#include <memory>
#include <span>
#include <string>

#include "cli/open_audio.h"

namespace orvalis::cli {

class Excerpts {
public:
  virtual ~Excerpts() = default;

  /// What the engine has heard, in order.
  virtual void hear(std::span<const std::int16_t> samples) = 0;
  /// No excerpt from now on starts before `sample`.
  virtual void forget_before(std::int64_t sample) = 0;
  /// Writes the audio from `start` to before `end`, in samples of what the engine heard, as WAV.
  /// Excerpts come in order and do not overlap. Throws OutputError.
  virtual void write(std::int64_t start, std::int64_t end, const std::string &path,
                     bool replace) = 0;
};

/// Excerpts of a file are its own samples: its rate, channels and sample format, or floating point
/// if it is compressed beyond exact values. What can be read only once gives what the engine heard.
std::unique_ptr<Excerpts> make_excerpts(const std::string &name, const AudioSettings &settings,
                                        int engine_rate_hz);

/// Excerpts of what the engine heard, whatever that came from.
std::unique_ptr<Excerpts> make_heard_excerpts(int rate_hz);

}  // namespace orvalis::cli
