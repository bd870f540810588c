// The real recordings that tests run on.
#pragma once

#include <gtest/gtest.h>

#include <cstdint>
#include <cstdio>
#include <string>
#include <vector>

namespace orvalis::test {

using Pcm = std::vector<std::int16_t>;

/// Reads 16-bit PCM; of a WAV file, what follows its 44-byte header. A missing file fails the test.
inline Pcm read_pcm(const std::string &path) {
  std::FILE *file = std::fopen(path.c_str(), "rb");
  if (file == nullptr) {
    ADD_FAILURE() << "no recording " << path;
    return {};
  }
  if (path.ends_with(".wav")) std::fseek(file, 44, SEEK_SET);
  Pcm pcm;
  std::int16_t block[4096];
  while (const std::size_t read = std::fread(block, sizeof *block, 4096, file)) {
    pcm.insert(pcm.end(), block, block + read);
  }
  std::fclose(file);
  EXPECT_FALSE(pcm.empty()) << path;
  return pcm;
}

/// A recording at 16 kHz, by its name below the folder of the spoken sentences.
inline Pcm speech_16k(const std::string &name) {
  return read_pcm(std::string(ORVALIS_SPEECH_16K) + "/" + name);
}

/// A recording at 8 kHz.
inline Pcm speech_8k(const std::string &name) {
  return read_pcm(std::string(ORVALIS_SPEECH_8K) + "/" + name);
}

/// Read sentences at 16 kHz, in the order of their transcripts.
inline const char *const kSentences[] = {"librivox/sense_and_sensibility_01_austen_64kb-0870.wav",
                                         "librivox/sense_and_sensibility_01_austen_64kb-0880.wav",
                                         "librivox/sense_and_sensibility_01_austen_64kb-0890.wav",
                                         "librivox/sense_and_sensibility_01_austen_64kb-0920.wav",
                                         "librivox/sense_and_sensibility_01_austen_64kb-0930.wav"};

}  // namespace orvalis::test
