#include "cli/split.h"

#include <fmt/format.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cctype>
#include <cerrno>
#include <deque>
#include <filesystem>
#include <map>
#include <optional>
#include <utility>

namespace orvalis::cli {
namespace {

std::string stem_of(const std::string &input) { return file_name_of(input).stem(); }

/// Names the files and opens them.
class Parts {
public:
  Parts(SplitSettings settings, const std::string &input)
      : settings_(std::move(settings)), stem_(stem_of(input)) {}

  std::string name_of(int number) const {
    return std::filesystem::path(settings_.folder) / fmt::format("{}-{:03}.wav", stem_, number);
  }

  OutputFile open(int number, const SampleFormat &format) const {
    return {name_of(number), format, settings_.rules};
  }

private:
  SplitSettings settings_;
  std::string stem_;
};

/// The sample format of a WAV file that holds a file's samples exactly.
int exact_subtype(int format) {
  switch (const int subtype = format & SF_FORMAT_SUBMASK) {
    case SF_FORMAT_PCM_U8:
    case SF_FORMAT_PCM_16:
    case SF_FORMAT_PCM_24:
    case SF_FORMAT_PCM_32:
    case SF_FORMAT_DOUBLE:
    case SF_FORMAT_ULAW:
    case SF_FORMAT_ALAW:
      return subtype;
    case SF_FORMAT_PCM_S8:
      return SF_FORMAT_PCM_U8;
    case SF_FORMAT_IMA_ADPCM:
    case SF_FORMAT_MS_ADPCM:
    case SF_FORMAT_GSM610:
    case SF_FORMAT_ALAC_16:
      return SF_FORMAT_PCM_16;
    case SF_FORMAT_ALAC_20:
    case SF_FORMAT_ALAC_24:
      return SF_FORMAT_PCM_24;
    case SF_FORMAT_ALAC_32:
      return SF_FORMAT_PCM_32;
    default:
      return SF_FORMAT_FLOAT;
  }
}

/// Reads the input a second time, from its beginning to the last utterance: in lossily compressed
/// files a seek is not exact to the sample.
class SplitSource : public Split {
public:
  SplitSource(Parts parts, OpenAudio source, int engine_rate_hz)
      : parts_(std::move(parts)), source_(std::move(source)), engine_rate_hz_(engine_rate_hz) {}

  void push(std::span<const std::int16_t>) override {}
  void forget_before(std::int64_t) override {}

  void write(const Utterance &found) override {
    const SF_INFO &info = source_.info;
    const int subtype = exact_subtype(info.format);
    OutputFile file =
        parts_.open(found.number, {info.samplerate, info.channels, SF_FORMAT_WAV | subtype});
    const sf_count_t first = source_frame(found.start), end = source_frame(found.end);
    if (subtype == SF_FORMAT_FLOAT)
      copy<float>(first, end, sf_readf_float, file);
    else if (subtype == SF_FORMAT_DOUBLE)
      copy<double>(first, end, sf_readf_double, file);
    else
      copy<int>(first, end, sf_readf_int, file);
    file.commit();
  }

private:
  /// The source's frame nearest to a sample of the engine's.
  sf_count_t source_frame(std::int64_t sample) const {
    return (sample * source_.info.samplerate + engine_rate_hz_ / 2) / engine_rate_hz_;
  }

  template <class Sample>
  void copy(sf_count_t first, sf_count_t end, sf_count_t (*read)(SNDFILE *, Sample *, sf_count_t),
            OutputFile &file) {
    const auto channels = static_cast<std::size_t>(source_.info.channels);
    std::vector<Sample> samples(std::max<std::size_t>(1, 65536 / channels) * channels);
    const auto room = static_cast<sf_count_t>(samples.size() / channels);
    while (position_ < end) {
      const bool inside = position_ >= first;
      const sf_count_t left = (inside ? end : first) - position_;
      const sf_count_t got = read(source_.file.get(), samples.data(), std::min(left, room));
      if (got <= 0) {
        source_.check_read();
        // Resampling may have rounded the end up, by two samples of the engine at most.
        if ((end - position_) * engine_rate_hz_ <= 2 * source_.info.samplerate + engine_rate_hz_)
          return;
        throw AudioError("cut short while it was read");
      }
      const auto values = static_cast<std::size_t>(got) * channels;
      if (inside) file.write(std::span<const Sample>(samples.data(), values));
      position_ += got;
    }
  }

  Parts parts_;
  OpenAudio source_;
  int engine_rate_hz_;
  sf_count_t position_ = 0;
};

/// The last samples of a stream. Up to a minute is kept in memory, what is older in a temporary
/// file.
class KeptSamples {
public:
  /// The file lies beside `name`.
  explicit KeptSamples(std::string name) : name_(std::move(name)) {}

  void push(std::span<const std::int16_t> samples) {
    recent_.insert(recent_.end(), samples.begin(), samples.end());
    if (recent_.size() < kMaxInMemory) return;
    if (!older_) older_.emplace(name_);
    const std::vector<std::int16_t> moved(recent_.begin(), recent_.end());
    const auto bytes = static_cast<ssize_t>(moved.size() * sizeof(std::int16_t));
    if (const ssize_t written = pwrite(older_->descriptor(), moved.data(),
                                       static_cast<std::size_t>(bytes), offset_of(first_recent_));
        written != bytes)
      throw AudioError(name_ + ": " + message_of(written < 0 ? errno : ENOSPC));
    first_recent_ += std::ssize(moved);
    recent_.clear();
  }

  void forget_before(std::int64_t sample) {
    const auto count = std::clamp<std::int64_t>(sample - first_recent_, 0, std::ssize(recent_));
    recent_.erase(recent_.begin(), recent_.begin() + count);
    first_recent_ += count;
    if (sample < first_recent_) return;
    older_.reset();
    first_older_ = first_recent_;
  }

  /// Appends the samples from `first` to before `end` to a file.
  void copy(std::int64_t first, std::int64_t end, OutputFile &file) const {
    std::vector<std::int16_t> samples;
    while (first < end) {
      samples.resize(static_cast<std::size_t>(std::min<std::int64_t>(end - first, 65536)));
      if (first < first_recent_) {
        samples.resize(std::min(samples.size(), static_cast<std::size_t>(first_recent_ - first)));
        const std::size_t bytes = samples.size() * sizeof(std::int16_t);
        if (pread(older_->descriptor(), samples.data(), bytes, offset_of(first)) !=
            static_cast<ssize_t>(bytes))
          throw AudioError(name_ + ": " + message_of(EIO));
      } else {
        std::copy_n(recent_.begin() + (first - first_recent_), samples.size(), samples.begin());
      }
      file.write(std::span<const short>(samples));
      first += std::ssize(samples);
    }
  }

private:
  static constexpr std::size_t kMaxInMemory = 960000;  ///< A minute at 16 kHz

  off_t offset_of(std::int64_t sample) const {
    return (sample - first_older_) * static_cast<off_t>(sizeof(std::int16_t));
  }

  std::string name_;
  std::optional<TemporaryFile> older_;
  std::int64_t first_older_ = 0;   ///< Position of the first sample in the file
  std::int64_t first_recent_ = 0;  ///< And of the first one in memory
  std::deque<std::int16_t> recent_;
};

/// Keeps the audio that an utterance may still need.
class SplitProcessed : public Split {
public:
  SplitProcessed(Parts parts, int rate_hz)
      : parts_(std::move(parts)), rate_hz_(rate_hz), kept_(parts_.name_of(0)) {}

  void push(std::span<const std::int16_t> samples) override { kept_.push(samples); }
  void forget_before(std::int64_t sample) override { kept_.forget_before(sample); }

  void write(const Utterance &found) override {
    OutputFile file = parts_.open(found.number, {rate_hz_, 1, SF_FORMAT_WAV | SF_FORMAT_PCM_16});
    kept_.copy(found.start, found.end, file);
    file.commit();
  }

private:
  Parts parts_;
  int rate_hz_;
  KeptSamples kept_;
};

bool can_be_read_again(const std::string &name) {
  struct stat status;
  return name != "-" && stat(name.c_str(), &status) == 0 && S_ISREG(status.st_mode);
}

}  // namespace

std::string same_parts(const std::vector<std::string> &inputs) {
  std::map<std::string, std::string> input_of_stem;
  for (const std::string &input : inputs) {
    const auto [other, is_new] = input_of_stem.emplace(stem_of(input), input);
    if (!is_new) return fmt::format("{} and {}", other->second, input);
  }
  return "";
}

bool is_part_of(const std::string &input, const std::string &name) {
  const std::string before = stem_of(input) + "-", after = ".wav";
  if (!name.starts_with(before) || !name.ends_with(after)) return false;
  if (name.size() < before.size() + 3 + after.size()) return false;
  return std::ranges::all_of(name.begin() + std::ssize(before), name.end() - std::ssize(after),
                             [](unsigned char c) { return std::isdigit(c) != 0; });
}

std::unique_ptr<Split> split_source(const SplitSettings &settings, const std::string &input,
                                    const AudioSettings &audio, int engine_rate_hz) {
  if (settings.folder.empty()) return nullptr;
  if (!can_be_read_again(input)) return split_processed(settings, input, engine_rate_hz);
  return std::make_unique<SplitSource>(Parts(settings, input), open_audio(input, audio),
                                       engine_rate_hz);
}

std::unique_ptr<Split> split_processed(const SplitSettings &settings, const std::string &input,
                                       int rate_hz) {
  if (settings.folder.empty()) return nullptr;
  return std::make_unique<SplitProcessed>(Parts(settings, input), rate_hz);
}

}  // namespace orvalis::cli
