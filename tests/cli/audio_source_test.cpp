#include "cli/audio_source.h"

#include <gtest/gtest.h>

#include <cmath>
#include <limits>
#include <numbers>
#include <string>
#include <vector>

#include "tests/support/audio_file.h"
#include "tests/support/temporary_folder.h"

namespace orvalis::cli {
namespace {

using test::TemporaryFolder;
using test::write_audio;

constexpr int kWav16 = SF_FORMAT_WAV | SF_FORMAT_PCM_16;
constexpr int kWavFloat = SF_FORMAT_WAV | SF_FORMAT_FLOAT;

std::vector<short> read_all(const std::string &path, const AudioSettings &settings = {}) {
  AudioSource source(path, settings);
  std::vector<short> samples;
  for (auto chunk = source.read(); !chunk.empty(); chunk = source.read())
    samples.insert(samples.end(), chunk.begin(), chunk.end());
  source.check_complete();
  return samples;
}

TEST(AudioSource, SixteenBitsArriveUntouched) {
  const TemporaryFolder folder;
  std::vector<short> every_value, stereo;
  for (int value = -32768; value <= 32767; ++value) {
    every_value.push_back(static_cast<short>(value));
    stereo.insert(stereo.end(), {static_cast<short>(~value), static_cast<short>(value)});
  }
  for (const int rate : {8000, 16000}) {
    write_audio(folder / "mono.wav", every_value, rate, 1, kWav16);
    write_audio(folder / "stereo.flac", stereo, rate, 2, SF_FORMAT_FLAC | SF_FORMAT_PCM_16);
    EXPECT_EQ(read_all(folder / "mono.wav"), every_value);
    EXPECT_EQ(read_all(folder / "stereo.flac", {.channel = 2}), every_value);
    EXPECT_EQ(AudioSource(folder / "mono.wav", {}).rate_hz(), rate);
  }
  // Every mean here is -1/2, which rounds to even.
  EXPECT_EQ(read_all(folder / "stereo.flac"), std::vector<short>(65536, 0));
}

TEST(AudioSource, PairsAreTheirTwoChannels) {
  const TemporaryFolder folder;
  std::vector<short> pairs;
  for (int i = 0; i < 30000; ++i)
    pairs.push_back(static_cast<short>(9000 * std::sin(i * (i % 2 == 0 ? 0.01 : 0.013))));
  for (const int rate : {16000, 8000, 44100}) {
    for (const int format : {kWav16, kWavFloat}) {
      write_audio(folder / "pairs.wav", pairs, rate, 2, format);
      std::vector<short> expected;
      const auto left = read_all(folder / "pairs.wav", {.channel = 1, .wide_only = true});
      const auto right = read_all(folder / "pairs.wav", {.channel = 2, .wide_only = true});
      ASSERT_NEAR(static_cast<double>(left.size()), 15000 * 16000.0 / rate, 1);
      for (std::size_t i = 0; i < left.size(); ++i)
        expected.insert(expected.end(), {left[i], right[i]});
      EXPECT_EQ(read_all(folder / "pairs.wav", {.channels = Channels::kPair, .wide_only = true}),
                expected)
          << rate;
    }
  }
}

TEST(AudioSource, OtherFormatsAreRoundedAndClipped) {
  const TemporaryFolder folder;
  const float step = 1.0F / 32768;
  write_audio<float>(
      folder / "float.wav",
      {0, 1.5F, -7, 1, -1, 0.4F * step, 0.6F * step, -0.6F * step, -300.2F * step,
       std::numeric_limits<float>::infinity(), std::numeric_limits<float>::quiet_NaN()},
      16000, 1, kWavFloat);
  EXPECT_EQ(read_all(folder / "float.wav"),
            (std::vector<short>{0, 32767, -32768, 32767, -32768, 0, 1, -1, -300, 32767, 0}));

  // 24 bits lie in the upper bytes of an int: -1, 127, 129, -129 and the largest.
  write_audio<int>(folder / "24.wav", {-1 * 256, 127 * 256, 129 * 256, -129 * 256, 0x7fffff00},
                   16000, 1, SF_FORMAT_WAV | SF_FORMAT_PCM_24);
  EXPECT_EQ(read_all(folder / "24.wav"), (std::vector<short>{0, 0, 1, -1, 32767}));

  write_audio<short>(folder / "8.wav", {-32768, -256, 0, 256, 32512}, 8000, 1,
                     SF_FORMAT_WAV | SF_FORMAT_PCM_U8);
  EXPECT_EQ(read_all(folder / "8.wav"), (std::vector<short>{-32768, -256, 0, 256, 32512}));
}

TEST(AudioSource, ResamplingKeepsTimeAndLevel) {
  const TemporaryFolder folder;
  for (const int rate : {11025, 44100, 48000, 96000}) {
    // One second and a bit, so that neither rate divides it.
    std::vector<float> tone(static_cast<std::size_t>(rate) + 37);
    const auto wave = [](double seconds) {
      return 0.5 * std::sin(2 * std::numbers::pi * 440 * seconds);
    };
    for (std::size_t i = 0; i < tone.size(); ++i)
      tone[i] = static_cast<float>(wave(static_cast<double>(i) / rate));
    write_audio(folder / "tone.wav", tone, rate, 1, kWavFloat);

    const std::vector<short> samples = read_all(folder / "tone.wav");
    EXPECT_NEAR(static_cast<double>(samples.size()),
                16000.0 * static_cast<double>(tone.size()) / rate, 1);
    for (std::size_t i = 1000; i < 15000; ++i)
      ASSERT_NEAR(samples[i], 32768 * wave(static_cast<double>(i) / 16000), 4) << rate << ' ' << i;
  }
}

}  // namespace
}  // namespace orvalis::cli
