#include "cli/audio_source.h"

#include <fmt/format.h>
#include <samplerate.h>

#include <algorithm>
#include <array>
#include <cstdio>
#include <numeric>
#include <sstream>

#include "cli/word16.h"

namespace orvalis::cli {
namespace {

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

}  // namespace

AudioSource::AudioSource(const std::string &name, const AudioSettings &settings)
    : audio_(open_audio(name, settings)),
      channel_(settings.channel),
      channels_(settings.pair ? 2 : 1) {
  const SF_INFO &info = audio_.info;
  if (channel_ > info.channels)
    throw AudioError(fmt::format("there is no channel {}, only {}", channel_, info.channels));
  if (settings.pair && info.channels != 2)
    throw AudioError(fmt::format("two microphones are two channels, but there {} {}",
                                 info.channels == 1 ? "is" : "are", info.channels));
  if (info.samplerate != 16000 && (info.samplerate != 8000 || settings.wide_only)) {
    if (info.samplerate <= 0 || !src_is_valid_ratio(16000.0 / info.samplerate))
      throw AudioError(fmt::format("a rate of {} Hz cannot be converted", info.samplerate));
    resampler_.emplace(info.samplerate, 16000, static_cast<int>(channels_));
  }
  const bool unmixed = info.channels == 1 || channel_ > 0 || settings.pair;
  untouched_ = (info.format & SF_FORMAT_SUBMASK) == SF_FORMAT_PCM_16 && unmixed && !resampler_;
  // A header may claim any number of channels; no claim is worth more than 64 K values at a time.
  const int frames = std::clamp(info.samplerate / 100, 1, std::max(1, 65536 / info.channels));
  const auto values = static_cast<std::size_t>(frames) * static_cast<std::size_t>(info.channels);
  interleaved16_.resize(untouched_ ? values : 0);
  interleaved_.resize(untouched_ ? 0 : values);
}

std::span<const std::int16_t> AudioSource::read() {
  samples_.clear();
  // The resampler gives nothing until it has heard half the length of its filter.
  while (samples_.empty() && !ended_) ended_ = !(untouched_ ? read_untouched() : read_converted());
  samples_read_ += static_cast<std::int64_t>(samples_.size() / channels_);
  return samples_;
}

/// Reads into samples_ by way of the resampler and rounding; false at the end.
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

/// Reads into picked_; false at the end. Through float, which holds 24 bits exactly: libsndfile's
/// own way to 16 bits truncates and does not scale float files.
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
  // What a pipe's header says of the length is a guess of its writer.
  if (!audio_.piped && (frames_read_ < audio_.info.frames || chunk_cut_short(audio_.file.get())))
    throw AudioError("cut short: the file holds less audio than its header promises");
}

}  // namespace orvalis::cli
