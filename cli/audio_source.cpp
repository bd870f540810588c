#include "cli/audio_source.h"

#include <fmt/format.h>
#include <samplerate.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <cmath>
#include <cstdio>
#include <numeric>
#include <sstream>
#include <system_error>

namespace orvalis::cli {
namespace {

struct stat status_of(const std::string &name) {
  struct stat status;
  if ((name == "-" ? fstat(STDIN_FILENO, &status) : stat(name.c_str(), &status)) != 0)
    throw AudioError(std::generic_category().message(errno));
  return status;
}

/// Whether a format can be followed without seeking. The others fail on a pipe, some silently.
bool streams(int format) {
  switch (format & SF_FORMAT_TYPEMASK) {
    case SF_FORMAT_RAW:
    case SF_FORMAT_WAV:
    case SF_FORMAT_WAVEX:
    case SF_FORMAT_AU:
    case SF_FORMAT_AIFF:
    case SF_FORMAT_OGG:
      return true;
    default:
      return false;
  }
}

/// Whether the file lacks part of its audio chunk. libsndfile shortens such a chunk to what is
/// there, and says so only in its log, in lines such as "data : 35052 (should be 19956)".
bool chunk_cut_short(SNDFILE *file) {
  std::array<char, 16384> log{};
  sf_command(file, SFC_GET_LOG_INFO, log.data(), static_cast<int>(log.size()));
  // Live recorders cannot know the length beforehand and write the greatest possible.
  constexpr long long kOpenLength = 0x7fff0000;
  std::istringstream lines(log.data());
  for (std::string line; std::getline(lines, line);) {
    long long promised, present;
    for (const char *pattern : {" data : %lld (should be %lld)", " SSND : %lld (should be %lld)",
                                " Data Size : %lld (should be %lld)"})
      if (std::sscanf(line.c_str(), pattern, &promised, &present) == 2 && present < promised &&
          promised < kOpenLength)
        return true;
  }
  return false;
}

/// Floating point to 16 bits: full scale is 32768, rounded to nearest, clipped.
std::int16_t to_word16(float sample) {
  if (std::isnan(sample)) return 0;
  return static_cast<std::int16_t>(std::lrint(std::clamp(sample * 32768.0, -32768.0, 32767.0)));
}

}  // namespace

AudioSource::AudioSource(const std::string &name, const AudioSettings &settings)
    : channel_(settings.channel) {
  const struct stat status = status_of(name);
  piped_ = !S_ISREG(status.st_mode);
  if (S_ISDIR(status.st_mode)) throw AudioError(std::generic_category().message(EISDIR));
  if (!settings.raw && !piped_ && status.st_size == 0) throw AudioError("the file is empty");

  if (settings.raw) {
    info_.format = SF_FORMAT_RAW | SF_FORMAT_PCM_16 | SF_ENDIAN_LITTLE;
    info_.samplerate = settings.raw_rate_hz;
    info_.channels = settings.raw_channels;
  }
  file_.reset(name == "-" ? sf_open_fd(STDIN_FILENO, SFM_READ, &info_, SF_FALSE)
                          : sf_open(name.c_str(), SFM_READ, &info_));
  if (piped_ && (!file_ || !streams(info_.format)))
    throw AudioError("not WAV, AIFF, AU or Ogg audio, as a pipe must carry (or use --raw)");
  if (!file_) throw AudioError(sf_strerror(nullptr));

  if (channel_ > info_.channels)
    throw AudioError(fmt::format("there is no channel {}, only {}", channel_, info_.channels));
  if (info_.samplerate != 8000 && info_.samplerate != 16000) {
    if (info_.samplerate <= 0 || !src_is_valid_ratio(16000.0 / info_.samplerate))
      throw AudioError(fmt::format("a rate of {} Hz cannot be converted", info_.samplerate));
    resampler_.emplace(info_.samplerate, 16000);
  }
  const bool single = info_.channels == 1 || channel_ > 0;
  untouched_ = (info_.format & SF_FORMAT_SUBMASK) == SF_FORMAT_PCM_16 && single && !resampler_;
  // A header may claim any number of channels; no claim is worth more than 64 K values at a time.
  const int frames = std::clamp(info_.samplerate / 100, 1, std::max(1, 65536 / info_.channels));
  const auto values = static_cast<std::size_t>(frames) * static_cast<std::size_t>(info_.channels);
  interleaved16_.resize(untouched_ ? values : 0);
  interleaved_.resize(untouched_ ? 0 : values);
}

std::span<const std::int16_t> AudioSource::read() {
  samples_.clear();
  // The resampler gives nothing until it has heard half the length of its filter.
  while (samples_.empty() && !ended_) ended_ = !(untouched_ ? read_untouched() : read_converted());
  samples_read_ += static_cast<std::int64_t>(samples_.size());
  return samples_;
}

/// Reads into samples_ by way of the resampler and rounding; false at the end.
bool AudioSource::read_converted() {
  const bool more = read_mono();
  if (resampler_) {
    resampled_.clear();
    resampler_->process(mono_, !more, resampled_);
  }
  std::ranges::transform(resampler_ ? resampled_ : mono_, std::back_inserter(samples_), to_word16);
  return more;
}

/// Reads 16-bit samples of one channel into samples_; false at the end.
bool AudioSource::read_untouched() {
  const auto channels = static_cast<std::size_t>(info_.channels);
  const auto first = static_cast<std::size_t>(std::max(channel_, 1) - 1);
  const sf_count_t frames =
      sf_readf_short(file_.get(), interleaved16_.data(),
                     static_cast<sf_count_t>(interleaved16_.size() / channels));
  frames_read_ += frames;
  for (std::size_t i = 0; i < static_cast<std::size_t>(frames); ++i)
    samples_.push_back(interleaved16_[i * channels + first]);
  return frames > 0;
}

/// Reads into mono_; false at the end. Through float, which holds 24 bits exactly: libsndfile's own
/// way to 16 bits truncates and does not scale float files.
bool AudioSource::read_mono() {
  const auto channels = static_cast<std::size_t>(info_.channels);
  const sf_count_t frames = sf_readf_float(file_.get(), interleaved_.data(),
                                           static_cast<sf_count_t>(interleaved_.size() / channels));
  frames_read_ += frames;
  mono_.resize(static_cast<std::size_t>(frames));
  for (std::size_t i = 0; i < mono_.size(); ++i) {
    const float *frame = &interleaved_[i * channels];
    mono_[i] = channel_ > 0
                   ? frame[channel_ - 1]
                   : std::accumulate(frame, frame + channels, 0.0F) / static_cast<float>(channels);
  }
  return frames > 0;
}

void AudioSource::check_complete() const {
  if (sf_error(file_.get()) != SF_ERR_NO_ERROR) throw AudioError(sf_strerror(file_.get()));
  // What a pipe's header says of the length is a guess of its writer.
  if (!piped_ && (frames_read_ < info_.frames || chunk_cut_short(file_.get())))
    throw AudioError("cut short: the file holds less audio than its header promises");
}

}  // namespace orvalis::cli
