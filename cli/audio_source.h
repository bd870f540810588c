// Any audio file, raw samples or standard input, read as the 16-bit samples that the engine takes.
#pragma once

#include <array>
#include <cstdint>
#include <optional>
#include <span>
#include <string>
#include <vector>

#include "cli/audio_file.h"
#include "cli/input_bytes.h"
#include "cli/resampler.h"

namespace orvalis::cli {

/// What to do with several channels, unless one is picked.
enum class Channels {
  kMean,    ///< Average them
  kPair,    ///< Keep two as two; there must be two
  kRefuse,  ///< The user has to decide
};

struct AudioSettings {
  bool raw = false;  ///< No header: 16-bit little-endian samples
  int raw_rate_hz = 16000;
  int raw_channels = 1;
  int channel = 0;  ///< Picks one, from 1; 0 picks none
  Channels channels = Channels::kMean;
  const char *channel_hint = "";  ///< For the error of kRefuse: the ways to decide
  bool wide_only = false;         ///< 8 kHz is converted like other rates
  bool partial = false;           ///< Input that is cut short is no error
};

/// An open input and its format.
struct OpenAudio {
  std::unique_ptr<InputBytes> bytes;
  Sndfile file;
  SF_INFO info{};
  bool has_header = false;                   ///< Though it is raw
  bool piped = false;                        ///< Can be read only once, and its length is unknown
  std::optional<std::int64_t> promised_end;  ///< In bytes, if the header has chunks

  /// Throws AudioError if the bytes could not be read.
  void check_read() const;
};

/// Opens a file, or standard input for "-". Several threads may do so at once. Throws AudioError.
OpenAudio open_audio(const std::string &name, const AudioSettings &settings);

class AudioSource {
public:
  /// Opens the input. Throws AudioError.
  AudioSource(const std::string &name, const AudioSettings &settings);

  /// Rate of the samples that read() returns: 8000 or 16000.
  int rate_hz() const { return resampler_ ? 16000 : audio_.info.samplerate; }

  /// The input's own rate.
  int source_rate_hz() const { return audio_.info.samplerate; }

  /// The next chunk, of about 10 ms, so that live audio is processed at once. Empty at the end.
  /// Pairs are interleaved. Throws AudioError if the input cannot be read.
  std::span<const std::int16_t> read();

  /// Samples per channel that have been read from the input so far.
  std::int64_t source_frames_read() const { return frames_read_; }

  /// Samples per channel that read() has returned so far, and the same in seconds.
  std::int64_t samples_read() const { return samples_read_; }
  double seconds_read() const { return static_cast<double>(samples_read_) / rate_hz(); }

  /// Of the samples that read() has returned, those that are clipped, and where the first one is:
  /// three or more at full scale, in a row or with single others in between.
  std::int64_t clipped() const { return clipped_; }
  double first_clipped_s() const { return static_cast<double>(first_clipped_) / rate_hz(); }

  /// Whether raw input begins like a WAV file.
  bool raw_has_header() const { return audio_.has_header; }

  /// Length of the whole input, if known.
  std::optional<double> length_seconds() const {
    if (audio_.piped) return std::nullopt;
    return static_cast<double>(audio_.info.frames) / audio_.info.samplerate;
  }

  /// After the end: throws AudioError if it was due to an error, or came before the end that the
  /// header promises. If the settings allow the latter, returns a warning, else "".
  std::string check_complete() const;

private:
  bool read_untouched();
  bool read_converted();
  bool read_float();
  /// Neighbouring samples at full scale.
  struct FullScale {
    std::int64_t first, last, count;
  };

  void count_clipped();
  bool is_cut_short() const;

  OpenAudio audio_;
  bool partial_;
  bool ended_ = false;
  bool untouched_ = false;  ///< 16-bit samples reach the engine as they are
  int channel_;             ///< The one that is picked, from 1; or 0
  std::size_t channels_;    ///< Of what read() returns
  sf_count_t frames_read_ = 0;
  std::int64_t samples_read_ = 0;
  std::int64_t clipped_ = 0, first_clipped_ = 0;
  std::array<FullScale, 2> full_scale_{};  ///< The last ones of each channel
  std::optional<Resampler> resampler_;
  std::vector<float> interleaved_, picked_, resampled_;
  std::vector<std::int16_t> interleaved16_, samples_;
};

}  // namespace orvalis::cli
