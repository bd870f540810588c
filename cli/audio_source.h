// Any audio file, or standard input, as the 16-bit mono samples that the engine takes.
#pragma once

#include <sndfile.h>

#include <algorithm>
#include <cstdint>
#include <memory>
#include <optional>
#include <span>
#include <stdexcept>
#include <string>
#include <vector>

#include "cli/resampler.h"

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
  int channel = 0;  ///< The one to listen to, from 1; 0 takes the mean of all
};

class AudioSource {
public:
  /// Opens a file, or standard input for "-".
  AudioSource(const std::string &name, const AudioSettings &settings);

  /// Rate of the samples that read() returns: 8000 or 16000.
  int rate_hz() const { return resampler_ ? 16000 : info_.samplerate; }

  /// The next samples, about 10 ms, so that a live source is heard at once. Empty at the end.
  std::span<const std::int16_t> read();

  /// Hands all that is left to `take` in blocks of exactly `length` samples; a remainder is
  /// dropped.
  template <class Take>
  void for_each_block(std::size_t length, Take take) {
    std::vector<std::int16_t> block;
    for (auto piece = read(); !piece.empty(); piece = read()) {
      while (!piece.empty()) {
        const auto part = piece.first(std::min(piece.size(), length - block.size()));
        block.insert(block.end(), part.begin(), part.end());
        piece = piece.subspan(part.size());
        if (block.size() < length) continue;
        take(std::span<const std::int16_t>(block));
        block.clear();
      }
    }
  }

  /// Samples that read() has returned so far.
  std::int64_t samples_read() const { return samples_read_; }

  /// After the end: throws if that was a read error, or came before the end that the header names.
  void check_complete() const;

private:
  struct Closer {
    void operator()(SNDFILE *file) const { sf_close(file); }
  };

  bool read_untouched();
  bool read_converted();
  bool read_mono();

  std::unique_ptr<SNDFILE, Closer> file_;
  SF_INFO info_{};
  bool piped_ = false;
  bool ended_ = false;
  bool untouched_ = false;  ///< 16-bit samples go to the engine as they are
  int channel_ = 0;
  sf_count_t frames_read_ = 0;
  std::int64_t samples_read_ = 0;
  std::optional<Resampler> resampler_;
  std::vector<float> interleaved_, mono_, resampled_;
  std::vector<std::int16_t> interleaved16_, samples_;
};

}  // namespace orvalis::cli
