#include "cli/audio_source.h"

#include <fcntl.h>
#include <fmt/format.h>
#include <samplerate.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstdlib>
#include <filesystem>
#include <iterator>
#include <numeric>
#include <string_view>

#include "cli/audio_length.h"

namespace orvalis::cli {
namespace {

/// Clipped are at least as many samples at full scale, at most as far apart. Fewer may be the peaks
/// of sound that fits. Every second one is what resampling leaves of a clipped wave, which rings.
constexpr int kFewestClipped = 3, kFarthestClipped = 2;

/// Whether libsndfile reads what begins so without seeking. On a pipe the others fail, some of them
/// silently, and some look for an end that never comes.
bool streams(std::string_view head) {
  const auto type = head.substr(8);
  if (head.starts_with("RIFF") || head.starts_with("RIFX")) return type == "WAVE";
  if (head.starts_with("FORM")) return type == "AIFF" || type == "AIFC";
  return head.starts_with(".snd") || head.starts_with("dns.") || head.starts_with("OggS");
}

/// For a shell.
std::string quoted(const std::string &name) {
  std::string text = "'";
  for (const char c : name) text += c == '\'' ? "'\\''" : std::string(1, c);
  return text + "'";
}

/// Refuses, with the way out, what begins like a format that cannot be read here.
void check_content(const std::string &name, OpenAudio &audio) {
  std::array<char, 12> bytes{};
  audio.bytes->read_at(0, bytes);
  audio.check_read();
  const std::string_view head(bytes.data(), bytes.size());
  const char *format = head.substr(4, 4) == "ftyp"            ? "MP4 (or M4A)"
                       : head.starts_with("\x1A\x45\xDF\xA3") ? "WebM (or Matroska)"
                                                              : nullptr;
  if (format != nullptr)
    throw AudioError(
        fmt::format("{} is not read here; pipe it in: ffmpeg -i {} -f wav - | orvalis "
                    "COMMAND -",
                    format, name == "-" ? "FILE" : quoted(name)));
  const bool mp3 = head.starts_with("ID3") || (head[0] == '\xFF' && (head[1] & 0xE0) == 0xE0);
  if (audio.piped && (mp3 || head.starts_with("fLaC")))
    throw AudioError(
        fmt::format("{} is not read from a pipe; give the file by its name, or put "
                    "\"ffmpeg -i - -f wav - |\" before orvalis",
                    mp3 ? "MP3" : "FLAC"));
  if (audio.piped && !streams(head))
    throw AudioError("not WAV, AIFF, AU or Ogg audio, as a pipe must carry (or use --raw)");
}

/// libsndfile knows such files by their names only, which it is not told.
int headerless_format(const std::string &name) {
  const auto ending = std::filesystem::path(name).extension();
  return ending == ".gsm" ? SF_FORMAT_GSM610 : ending == ".vox" ? SF_FORMAT_VOX_ADPCM : 0;
}

int open_descriptor(const std::string &name) {
  const int descriptor = name == "-" ? fcntl(STDIN_FILENO, F_DUPFD_CLOEXEC, STDERR_FILENO + 1)
                                     : open(name.c_str(), O_RDONLY | O_CLOEXEC | O_NOCTTY);
  if (descriptor < 0) throw AudioError(message_of(errno));
  return descriptor;
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

void OpenAudio::check_read() const {
  if (const int error = bytes->error()) throw AudioError(message_of(error));
}

OpenAudio open_audio(const std::string &name, const AudioSettings &settings) {
  OpenAudio audio;
  const int descriptor = open_descriptor(name);
  struct stat status {};
  audio.piped = fstat(descriptor, &status) != 0 || !S_ISREG(status.st_mode);
  audio.bytes = std::make_unique<InputBytes>(descriptor, audio.piped);

  // Waits for a silent pipe before the lock is taken, so that no other thread has to.
  std::array<char, 1> first;
  const bool is_empty = !audio.bytes->read_at(0, first);
  audio.check_read();
  if (is_empty) throw AudioError("the input is empty");
  if (settings.raw) {
    audio.info.format = SF_FORMAT_RAW | SF_FORMAT_PCM_16 | SF_ENDIAN_LITTLE;
    audio.info.samplerate = settings.raw_rate_hz;
    audio.info.channels = settings.raw_channels;
    std::array<char, 4> head{};
    audio.has_header = audio.bytes->read_at(0, head) && std::string_view(head.data(), 4) == "RIFF";
  } else {
    check_content(name, audio);
    audio.promised_end = promised_end(*audio.bytes);
  }

  const auto lock = lock_opening();
  const auto open = [&audio] {
    audio.bytes->rewind();
    audio.file.reset(
        sf_open_virtual(InputBytes::functions(), SFM_READ, &audio.info, audio.bytes.get()));
    audio.check_read();
  };
  open();
  if (const int format = headerless_format(name); format != 0 && !audio.file && !audio.piped) {
    audio.info.samplerate = 8000;
    audio.info.channels = 1;
    audio.info.format = SF_FORMAT_RAW | format;
    open();
  }
  if (!audio.file) throw AudioError(sf_strerror(nullptr));
  audio.bytes->end_opening();
  return audio;
}

AudioSource::AudioSource(const std::string &name, const AudioSettings &settings)
    : audio_(open_audio(name, settings)),
      partial_(settings.partial),
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
  while (samples_.empty() && !ended_) {
    ended_ = !(untouched_ ? read_untouched() : read_converted());
    audio_.check_read();
  }
  count_clipped();
  samples_read_ += static_cast<std::int64_t>(samples_.size() / channels_);
  return samples_;
}

void AudioSource::count_clipped() {
  for (std::size_t i = 0; i < samples_.size(); ++i) {
    if (std::abs(samples_[i]) < INT16_MAX) continue;
    const std::int64_t at = samples_read_ + static_cast<std::int64_t>(i / channels_);
    FullScale &run = full_scale_[i % channels_];
    if (run.count == 0 || at - run.last > kFarthestClipped) run = {at, at, 0};
    run.last = at;
    if (++run.count < kFewestClipped) continue;
    if (clipped_ == 0) first_clipped_ = run.first;
    clipped_ += run.count == kFewestClipped ? kFewestClipped : 1;
  }
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

bool AudioSource::is_cut_short() const {
  // The number of frames in a stream is its writer's guess.
  return (!audio_.piped && frames_read_ < audio_.info.frames) ||
         (audio_.promised_end && audio_.bytes->ends_before(*audio_.promised_end));
}

std::string AudioSource::check_complete() const {
  const bool cut_short = is_cut_short();
  if (!cut_short && sf_error(audio_.file.get()) != SF_ERR_NO_ERROR)
    throw AudioError(sf_strerror(audio_.file.get()));
  if (!cut_short) return "";
  const std::string text = "cut short: there is less audio than the header promises";
  if (!partial_) throw AudioError(text + "; --partial takes what there is");
  return text;
}

}  // namespace orvalis::cli
