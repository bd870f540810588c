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
  sf_command(file, SFC_SET_CLIPPING, nullptr,
             SF_TRUE);  // else what exceeds full scale wraps around
  const auto count = static_cast<sf_count_t>(samples.size());
  if constexpr (std::is_same_v<T, float>)
    sf_write_float(file, samples.data(), count);
  else if constexpr (std::is_same_v<T, int>)
    sf_write_int(file, samples.data(), count);
  else
    sf_write_short(file, samples.data(), count);
  sf_close(file);
}

/// The samples of a mono file, full scale 1.
inline std::vector<float> read_audio(const std::string &path) {
  SF_INFO info{};
  SNDFILE *file = sf_open(path.c_str(), SFM_READ, &info);
  if (!file || info.channels != 1) throw std::runtime_error(path + " is not mono audio");
  std::vector<float> samples(static_cast<std::size_t>(info.frames));
  sf_read_float(file, samples.data(), info.frames);
  sf_close(file);
  return samples;
}

}  // namespace orvalis::test
