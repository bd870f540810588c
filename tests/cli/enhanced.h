// Audio for the commands that give audio, and what is to come of it.
#pragma once

#include <orvalis.h>
#include <algorithm>

#include <array>
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

/// Where in audio of that length a sample beyond its end comes from: mirrored, again and again.
inline std::size_t mirrored(std::size_t at, std::size_t length) {
  const std::size_t folded = at % (2 * length);
  return folded < length ? folded : 2 * length - 1 - folded;
}

/// What the library gives frame by frame, cut to the input's length from sample `skip` on.
inline Pcm suppressed(const Pcm &input, std::size_t mics, int mode, std::size_t skip) {
  const std::size_t length = input.size() / mics, delay = mics == 2 ? 160 : 48;
  NsInstance *ns = InitializeDoNS(mode, static_cast<std::int32_t>(mics), 0);
  Pcm output;
  const auto sample = [&](std::size_t at, std::size_t channel) {
    return input[mirrored(at, length) * mics + channel];
  };
  for (std::size_t at = 0; output.size() < (length > 0 ? length + skip : 0); at += 160) {
    Pcm in, out;
    for (std::size_t i = 0; i < 160 * mics; ++i) {
      in.push_back(sample(at + i / mics, i % mics));
      const std::size_t now = at + i / mics;
      out.push_back(now < delay ? std::int16_t{0} : sample(now - delay, 0));
    }
    const auto count = static_cast<std::int32_t>(in.size());
    ProcessDoNSFrame(ns, in.data(), count, out.data(), count);
    for (std::size_t i = 0; i < out.size(); i += mics) output.push_back(out[i]);
  }
  FreeMemoryNS(ns);
  output.erase(output.begin(), output.begin() + static_cast<std::ptrdiff_t>(length > 0 ? skip : 0));
  output.resize(length);
  return output;
}

/// What dynamics control gives.
inline Pcm levelled(Pcm samples) {
  const std::int64_t drc = InitializeDRC(16000, 0);
  const std::size_t length = samples.size();
  while (samples.size() % 160 != 0) samples.push_back(samples[mirrored(samples.size(), length)]);
  for (std::size_t at = 0; at < samples.size(); at += 160) ProcessDRC(drc, &samples[at], 160);
  FreeMemoryDRC(drc);
  samples.resize(length);
  return samples;
}

class Enhanced : public Tool {
protected:
  Enhanced() {
    SetLogSink([](int, const char *, const char *, void *) {}, nullptr);
  }

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
