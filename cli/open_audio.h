// Opening what the user names: any audio file, raw samples, or standard input.
#pragma once

#include <sndfile.h>

#include <memory>
#include <mutex>
#include <stdexcept>
#include <string>

namespace orvalis::cli {

/// What is wrong with one input; the others can still be done.
class AudioError : public std::runtime_error {
public:
  using std::runtime_error::runtime_error;
};

struct AudioSettings {
  bool raw = false;  ///< No header: 16-bit little-endian samples
  int raw_rate_hz = 16000;
  int raw_channels = 1;
  int channel = 0;         ///< The one to listen to, from 1; 0 takes the mean of all
  bool pair = false;       ///< Two channels, which stay two
  bool wide_only = false;  ///< 8 kHz is converted like other rates
};

struct SndfileCloser {
  void operator()(SNDFILE *file) const { sf_close(file); }
};
using SndfilePointer = std::unique_ptr<SNDFILE, SndfileCloser>;

struct OpenAudio {
  SndfilePointer file;
  SF_INFO info{};
  bool piped = false;  ///< Can be read only once, and its length is not known
};

/// libsndfile keeps the reason why a file did not open in one place for all threads. Who opens one,
/// to read or to write, holds this until the reason is known.
std::unique_lock<std::mutex> lock_opening();

/// Opens a file, or standard input for "-". Several threads may do so at once. Throws AudioError.
OpenAudio open_audio(const std::string &name, const AudioSettings &settings);

}  // namespace orvalis::cli
