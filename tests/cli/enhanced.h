// Input for the commands that write audio, and the output to expect.
#pragma once

#include <enhancement_stream.h>
#include <orvalis.h>

#include <algorithm>
#include <string>
#include <vector>

#include "tests/cli/tool.h"
#include "tests/support/audio_file.h"
#include "tests/support/noise.h"
#include "tests/support/recordings.h"

namespace orvalis::test {

constexpr int kWav16 = SF_FORMAT_WAV | SF_FORMAT_PCM_16;

inline std::string bytes_of(const Pcm &samples) {
  return {reinterpret_cast<const char *>(samples.data()), 2 * samples.size()};
}

inline Pcm samples_of(const std::string &bytes) {
  Pcm samples(bytes.size() / 2);
  std::copy_n(bytes.data(), 2 * samples.size(), reinterpret_cast<char *>(samples.data()));
  return samples;
}

inline Pcm samples_in(const std::string &file) {
  Pcm samples;
  for (const double value : read_audio(file).samples)
    samples.push_back(static_cast<std::int16_t>(value * 32768));
  return samples;
}

/// A card's name in white noise, after two seconds of it alone.
constexpr std::size_t kPause = 32000;
inline Pcm noisy_speech(unsigned seed = 1) {
  const Pcm speech = load_recording(kWide);
  const auto noise = unit_noise(kPause + speech.size(), NoiseColour::kWhite, seed);
  Pcm samples;
  for (std::size_t i = 0; i < noise.size(); ++i)
    samples.push_back(to_sample(100 * noise[i] + (i < kPause ? 0 : speech[i - kPause])));
  return samples;
}

/// Two microphones: the same speech, each with noise of its own.
inline Pcm noisy_pairs() {
  const Pcm left = noisy_speech(1), right = noisy_speech(2);
  Pcm pairs;
  for (std::size_t i = 0; i < left.size(); ++i) pairs.insert(pairs.end(), {left[i], right[i]});
  return pairs;
}

/// The output of the library's stream.
inline Pcm enhanced(const EnhancementSettings &settings, const Pcm &input) {
  EnhancementStream *stream = OpenEnhancementStream(&settings);
  Pcm output(input.size() + ENHANCEMENT_HELD_BACK);
  const auto room = static_cast<std::int32_t>(output.size());
  const auto count = static_cast<std::int32_t>(input.size());
  std::int32_t ready = PushEnhancementAudio(stream, input.data(), count, output.data(), room);
  ready += FlushEnhancementStream(stream, output.data() + ready, room - ready);
  CloseEnhancementStream(stream);
  output.resize(static_cast<std::size_t>(ready));
  return output;
}

constexpr EnhancementSettings kDenoise = ENHANCEMENT_SETTINGS_DEFAULT, kStrong = {1, 18, 0, 1},
                              kLate = {1, 13, 0, 0}, kTwo = {2, 13, 0, 1}, kLevel = {1, 0, 1, 1};

class Enhanced : public Tool {
protected:
  Enhanced() { SetLogSink(LogNothing, nullptr); }

  /// Raw samples through a command.
  Pcm through(const std::string &arguments, const Pcm &input) const {
    const Result result = run(arguments + " --raw --format raw - -", bytes_of(input));
    EXPECT_EQ(result.status, 0) << arguments << ": " << result.err;
    return samples_of(result.out);
  }

  std::string wav(const std::string &name, const Pcm &samples, int rate_hz = 16000,
                  int channels = 1) const {
    write_audio(folder_ / name, samples, rate_hz, channels, kWav16);
    return folder_ / name;
  }

  std::vector<std::string> names_in(const std::string &folder) const {
    std::vector<std::string> names;
    for (const auto &entry : std::filesystem::directory_iterator(folder))
      names.push_back(entry.path().filename());
    std::ranges::sort(names);
    return names;
  }
};

}  // namespace orvalis::test
