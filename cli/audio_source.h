// Any audio file, or standard input, as the 16-bit samples that the engine takes: mono, or a pair
// of microphones.
#pragma once

#include <algorithm>
#include <cstdint>
#include <optional>
#include <span>
#include <string>
#include <vector>

#include "cli/open_audio.h"
#include "cli/resampler.h"

namespace orvalis::cli {

class AudioSource {
public:
  /// Opens a file, or standard input for "-".
  AudioSource(const std::string &name, const AudioSettings &settings);

  /// Rate of the samples that read() returns: 8000 or 16000.
  int rate_hz() const { return resampler_ ? 16000 : audio_.info.samplerate; }

  /// The audio's own, before any conversion.
  int source_rate_hz() const { return audio_.info.samplerate; }
  int source_channels() const { return audio_.info.channels; }

  /// The next samples, about 10 ms, so that a live source is heard at once. Empty at the end. Those
  /// of a pair are interleaved.
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

  /// Samples of the audio, of each channel, that were read so far.
  std::int64_t source_frames_read() const { return frames_read_; }

  /// Samples of each channel that read() has returned so far.
  std::int64_t samples_read() const { return samples_read_; }

  /// Whether the source can be read only once.
  bool is_piped() const { return audio_.piped; }

  /// How much audio there is, unless that cannot be known.
  std::optional<double> length_seconds() const {
    if (audio_.piped) return std::nullopt;
    return static_cast<double>(audio_.info.frames) / audio_.info.samplerate;
  }

  /// After the end: throws if that was a read error, or came before the end that the header names.
  void check_complete() const;

private:
  bool read_untouched();
  bool read_converted();
  bool read_float();

  OpenAudio audio_;
  bool ended_ = false;
  bool untouched_ = false;  ///< 16-bit samples go to the engine as they are
  int channel_ = 0;
  std::size_t channels_ = 1;  ///< That read() returns
  sf_count_t frames_read_ = 0;
  std::int64_t samples_read_ = 0;
  std::optional<Resampler> resampler_;
  std::vector<float> interleaved_, picked_, resampled_;
  std::vector<std::int16_t> interleaved16_, samples_;
};

}  // namespace orvalis::cli
