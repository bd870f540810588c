#include "cli/audio_source.h"

#include <fcntl.h>
#include <fmt/format.h>
#include <poll.h>
#include <samplerate.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstdio>
#include <iterator>
#include <numeric>
#include <sstream>

namespace orvalis::cli {
namespace {

struct stat status_of(const std::string &name) {
  struct stat status;
  if ((name == "-" ? fstat(STDIN_FILENO, &status) : stat(name.c_str(), &status)) != 0)
    throw AudioError(message_of(errno));
  return status;
}

/// Whether libsndfile reads a format without seeking. On a pipe the others fail, some of them
/// silently.
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

/// Opens a pipe and waits until it has something to read.
int open_pipe(const std::string &name) {
  const int descriptor = name == "-" ? STDIN_FILENO : open(name.c_str(), O_RDONLY | O_CLOEXEC);
  if (descriptor < 0) throw AudioError(message_of(errno));
  pollfd readable{descriptor, POLLIN, 0};
  while (poll(&readable, 1, -1) < 0 && errno == EINTR) {
  }
  return descriptor;
}

/// Whether the file ends before its audio does. libsndfile then shortens the audio to what is
/// there, and says so only in its log, in lines such as "data : 35052 (should be 19956)".
bool is_truncated(SNDFILE *file) {
  std::array<char, 16384> log{};
  sf_command(file, SFC_GET_LOG_INFO, log.data(), static_cast<int>(log.size()));
  // Live recorders cannot know the length beforehand and write the largest possible.
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

/// The one place that decides what becomes of an input's channels.
void check_channels(int channels, const AudioSettings &settings) {
  if (settings.channel > channels)
    throw AudioError(fmt::format("there is no channel {}, only {}", settings.channel, channels));
  if (settings.channels == Channels::kPair && channels != 2)
    throw AudioError(fmt::format("two microphones are two channels, but there {} {}",
                                 channels == 1 ? "is" : "are", channels));
  if (settings.channels == Channels::kRefuse && channels > 1 && settings.channel == 0)
    throw AudioError(fmt::format("there are {} channels: {}", channels, settings.channel_hint));
}

}  // namespace

OpenAudio open_audio(const std::string &name, const AudioSettings &settings) {
  OpenAudio audio;
  const struct stat status = status_of(name);
  audio.piped = !S_ISREG(status.st_mode);
  if (S_ISDIR(status.st_mode)) throw AudioError(message_of(EISDIR));
  if (!settings.raw && !audio.piped && status.st_size == 0) throw AudioError("the file is empty");

  if (settings.raw) {
    audio.info.format = SF_FORMAT_RAW | SF_FORMAT_PCM_16 | SF_ENDIAN_LITTLE;
    audio.info.samplerate = settings.raw_rate_hz;
    audio.info.channels = settings.raw_channels;
  }
  // Waits for a silent pipe before the lock is taken, so that no other thread has to.
  const bool by_name = name != "-" && !audio.piped;
  const int descriptor = by_name ? -1 : audio.piped ? open_pipe(name) : STDIN_FILENO;

  const auto lock = lock_opening();
  audio.file.reset(by_name
                       ? sf_open(name.c_str(), SFM_READ, &audio.info)
                       : sf_open_fd(descriptor, SFM_READ, &audio.info, descriptor != STDIN_FILENO));
  if (audio.piped && (!audio.file || !streams(audio.info.format)))
    throw AudioError("not WAV, AIFF, AU or Ogg audio, as a pipe must carry (or use --raw)");
  if (!audio.file) throw AudioError(sf_strerror(nullptr));
  return audio;
}

AudioSource::AudioSource(const std::string &name, const AudioSettings &settings)
    : audio_(open_audio(name, settings)),
      channel_(settings.channel),
      channels_(settings.channels == Channels::kPair ? 2 : 1) {
  const SF_INFO &info = audio_.info;
  check_channels(info.channels, settings);
  if (channels_ == 2) channel_ = 0;
  if (info.samplerate != 16000 && (info.samplerate != 8000 || settings.wide_only)) {
    if (info.samplerate <= 0 || !src_is_valid_ratio(16000.0 / info.samplerate))
      throw AudioError(fmt::format("a rate of {} Hz cannot be converted", info.samplerate));
    resampler_.emplace(info.samplerate, 16000, static_cast<int>(channels_));
  }
  const bool unmixed = info.channels == 1 || channel_ > 0 || channels_ == 2;
  untouched_ = (info.format & SF_FORMAT_SUBMASK) == SF_FORMAT_PCM_16 && unmixed && !resampler_;
  // A header may claim any number of channels, so the buffer is limited to 64 K values.
  const int frames = std::clamp(info.samplerate / 100, 1, std::max(1, 65536 / info.channels));
  const auto values = static_cast<std::size_t>(frames) * static_cast<std::size_t>(info.channels);
  interleaved16_.resize(untouched_ ? values : 0);
  interleaved_.resize(untouched_ ? 0 : values);
}

std::span<const std::int16_t> AudioSource::read() {
  samples_.clear();
  // The resampler returns nothing until it has half the length of its filter.
  while (samples_.empty() && !ended_) ended_ = !(untouched_ ? read_untouched() : read_converted());
  samples_read_ += static_cast<std::int64_t>(samples_.size() / channels_);
  return samples_;
}

/// Reads into samples_, resampled if necessary and rounded; false at the end.
bool AudioSource::read_converted() {
  const bool more = read_float();
  if (resampler_) {
    resampled_.clear();
    resampler_->process(picked_, !more, resampled_);
  }
  std::ranges::transform(resampler_ ? resampled_ : picked_, std::back_inserter(samples_),
                         to_word16);
  return more;
}

/// Reads 16-bit samples of one channel, or a pair, into samples_; false at the end.
bool AudioSource::read_untouched() {
  const auto channels = static_cast<std::size_t>(audio_.info.channels);
  const auto first = static_cast<std::size_t>(std::max(channel_, 1) - 1);
  const sf_count_t frames =
      sf_readf_short(audio_.file.get(), interleaved16_.data(),
                     static_cast<sf_count_t>(interleaved16_.size() / channels));
  frames_read_ += frames;
  for (std::size_t i = 0; i < static_cast<std::size_t>(frames); ++i)
    for (std::size_t c = 0; c < channels_; ++c)
      samples_.push_back(interleaved16_[i * channels + first + c]);
  return frames > 0;
}

/// Reads into picked_; false at the end. A float holds 24 bits exactly; libsndfile's own conversion
/// to 16 bits truncates, and does not scale float files.
bool AudioSource::read_float() {
  const auto channels = static_cast<std::size_t>(audio_.info.channels);
  const sf_count_t frames = sf_readf_float(audio_.file.get(), interleaved_.data(),
                                           static_cast<sf_count_t>(interleaved_.size() / channels));
  frames_read_ += frames;
  if (channels_ == 2) {
    picked_.assign(interleaved_.begin(), interleaved_.begin() + 2 * frames);
    return frames > 0;
  }
  picked_.resize(static_cast<std::size_t>(frames));
  for (std::size_t i = 0; i < picked_.size(); ++i) {
    const float *frame = &interleaved_[i * channels];
    picked_[i] = channel_ > 0 ? frame[channel_ - 1]
                              : std::accumulate(frame, frame + channels, 0.0F) /
                                    static_cast<float>(channels);
  }
  return frames > 0;
}

void AudioSource::check_complete() const {
  if (sf_error(audio_.file.get()) != SF_ERR_NO_ERROR)
    throw AudioError(sf_strerror(audio_.file.get()));
  // The length in a pipe's header is its writer's guess.
  if (!audio_.piped && (frames_read_ < audio_.info.frames || is_truncated(audio_.file.get())))
    throw AudioError("cut short: the file holds less audio than its header promises");
}

}  // namespace orvalis::cli
