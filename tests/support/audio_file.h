// Audio files written and read whole, for tests.
#pragma once

#include <sndfile.h>

#include <stdexcept>
#include <string>
#include <type_traits>
#include <vector>

namespace orvalis::test {

/// Writes interleaved samples; T is short, int or float, `format` one of libsndfile's.
template <typename T>
void write_audio(const std::string &path, const std::vector<T> &samples, int rate_hz, int channels,
                 int format) {
  SF_INFO info{};
  info.samplerate = rate_hz;
  info.channels = channels;
  info.format = format;
  SNDFILE *file = sf_open(path.c_str(), SFM_WRITE, &info);
  if (!file) throw std::runtime_error(path + ": " + sf_strerror(nullptr));
  // Else what exceeds full scale wraps around.
  sf_command(file, SFC_SET_CLIPPING, nullptr, SF_TRUE);
  const auto count = static_cast<sf_count_t>(samples.size());
  if constexpr (std::is_same_v<T, float>)
    sf_write_float(file, samples.data(), count);
  else if constexpr (std::is_same_v<T, int>)
    sf_write_int(file, samples.data(), count);
  else
    sf_write_short(file, samples.data(), count);
  sf_close(file);
}

struct Audio {
  SF_INFO info{};
  std::vector<double> samples;  // interleaved; of every sample format the exact values
};

inline Audio read_audio(const std::string &path) {
  Audio audio;
  SNDFILE *file = sf_open(path.c_str(), SFM_READ, &audio.info);
  if (!file) throw std::runtime_error(path + ": " + sf_strerror(nullptr));
  audio.samples.resize(static_cast<std::size_t>(audio.info.frames * audio.info.channels));
  const auto read = sf_readf_double(file, audio.samples.data(), audio.info.frames);
  sf_close(file);
  if (read != audio.info.frames) throw std::runtime_error(path + ": cut short");
  return audio;
}

}  // namespace orvalis::test
