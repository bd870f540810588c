#include "cli/excerpts.h"

#include <sys/stat.h>

#include <algorithm>
#include <deque>
#include <type_traits>
#include <vector>

#include "cli/output_file.h"

namespace orvalis::cli {
namespace {

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

/// Reads a file a second time, from excerpt to excerpt: where a seek leads to in a file that is
/// compressed with losses is not certain to the sample.
class FileExcerpts : public Excerpts {
public:
  FileExcerpts(const std::string &name, const AudioSettings &settings, int engine_rate_hz)
      : source_(open_audio(name, settings)), engine_rate_hz_(engine_rate_hz) {}

  void hear(std::span<const std::int16_t>) override {}
  void forget_before(std::int64_t) override {}

  void write(std::int64_t start, std::int64_t end, const std::string &path, bool replace) override {
    const SF_INFO &info = source_.info;
    const int subtype = exact_subtype(info.format);
    OutputFile file(path, {info.samplerate, info.channels, SF_FORMAT_WAV | subtype}, replace);
    if (subtype == SF_FORMAT_FLOAT)
      copy<float>(source_frame(start), source_frame(end), sf_readf_float, file);
    else if (subtype == SF_FORMAT_DOUBLE)
      copy<double>(source_frame(start), source_frame(end), sf_readf_double, file);
    else
      copy<int>(source_frame(start), source_frame(end), sf_readf_int, file);
    file.commit();
  }

private:
  /// The source's frame nearest to a sample that the engine heard.
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
      if (got <= 0) return;  // resampling may round the end of the input up
      const auto values = static_cast<std::size_t>(got) * channels;
      if (inside) file.write(std::span<const Sample>(samples.data(), values));
      position_ += got;
    }
  }

  OpenAudio source_;
  int engine_rate_hz_;
  sf_count_t position_ = 0;
};

/// Keeps what may still be asked for.
class HeardExcerpts : public Excerpts {
public:
  explicit HeardExcerpts(int rate_hz) : rate_hz_(rate_hz) {}

  void hear(std::span<const std::int16_t> samples) override {
    kept_.insert(kept_.end(), samples.begin(), samples.end());
  }

  void forget_before(std::int64_t sample) override {
    const auto gone = std::clamp<std::int64_t>(sample - first_, 0, std::ssize(kept_));
    kept_.erase(kept_.begin(), kept_.begin() + gone);
    first_ += gone;
  }

  void write(std::int64_t start, std::int64_t end, const std::string &path, bool replace) override {
    OutputFile file(path, {rate_hz_, 1, SF_FORMAT_WAV | SF_FORMAT_PCM_16}, replace);
    const std::vector<short> samples(kept_.begin() + (start - first_),
                                     kept_.begin() + (end - first_));
    file.write(samples);
    file.commit();
  }

private:
  int rate_hz_;
  std::int64_t first_ = 0;  // position of the first sample that is kept
  std::deque<short> kept_;
};

bool can_be_read_again(const std::string &name) {
  struct stat status;
  return name != "-" && stat(name.c_str(), &status) == 0 && S_ISREG(status.st_mode);
}

}  // namespace

std::unique_ptr<Excerpts> make_excerpts(const std::string &name, const AudioSettings &settings,
                                        int engine_rate_hz) {
  if (!can_be_read_again(name)) return make_heard_excerpts(engine_rate_hz);
  return std::make_unique<FileExcerpts>(name, settings, engine_rate_hz);
}

std::unique_ptr<Excerpts> make_heard_excerpts(int rate_hz) {
  return std::make_unique<HeardExcerpts>(rate_hz);
}

}  // namespace orvalis::cli
