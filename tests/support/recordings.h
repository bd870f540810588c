// Recordings of speech, as samples. A file that is missing or has another format ends the test.
#pragma once

#include <algorithm>
#include <cstdint>
#include <fstream>
#include <iterator>
#include <stdexcept>
#include <string>
#include <vector>

namespace orvalis::test {

using Pcm = std::vector<std::int16_t>;

/// A little-endian number of the file's, whatever this processor's order is.
inline std::uint32_t little_endian(const char *bytes, int count) {
  std::uint32_t value = 0;
  for (int i = count - 1; i >= 0; --i) value = value << 8 | static_cast<std::uint8_t>(bytes[i]);
  return value;
}

/// Mono 16-bit samples of a WAV file, or of a headerless one, which is little-endian too.
inline Pcm load_recording(const std::string &path) {
  std::ifstream file(path, std::ios::binary);
  const std::string bytes{std::istreambuf_iterator<char>(file), {}};
  std::size_t begin = 0;
  std::size_t end = bytes.size();
  if (bytes.starts_with("RIFF")) {
    // Format 1 (PCM), one channel; block size and width of a sample.
    const bool is_mono_pcm = bytes.compare(8, 12, std::string("WAVEfmt \x10\0\0\0", 12)) == 0 &&
                             bytes.compare(20, 4, std::string("\1\0\1\0", 4)) == 0 &&
                             bytes.compare(32, 8, std::string("\2\0\x10\0data", 8)) == 0;
    if (!is_mono_pcm || bytes.size() < 44) throw std::runtime_error(path + ": not mono 16-bit PCM");
    begin = 44;
    end = std::min<std::size_t>(end, begin + little_endian(&bytes[40], 4));
  }
  Pcm samples((end - begin) / 2);
  if (samples.empty()) throw std::runtime_error(path + ": no samples");
  for (std::size_t i = 0; i < samples.size(); ++i)
    samples[i] = static_cast<std::int16_t>(little_endian(&bytes[begin + 2 * i], 2));
  return samples;
}

inline Pcm speech_16k(const std::string &name) {
  return load_recording(std::string(ORVALIS_SPEECH_16K "/") + name);
}

inline Pcm speech_8k(const std::string &name) {
  return load_recording(std::string(ORVALIS_SPEECH_8K "/") + name);
}

/// Read sentences at 16 kHz, in the order of their transcripts.
inline const char *const kSentences[] = {"librivox/sense_and_sensibility_01_austen_64kb-0870.wav",
                                         "librivox/sense_and_sensibility_01_austen_64kb-0880.wav",
                                         "librivox/sense_and_sensibility_01_austen_64kb-0890.wav",
                                         "librivox/sense_and_sensibility_01_austen_64kb-0920.wav",
                                         "librivox/sense_and_sensibility_01_austen_64kb-0930.wav"};

}  // namespace orvalis::test
