// Noise of known level and the level of speech, for tests that mix both.
#pragma once

#include <algorithm>
#include <cmath>
#include <cstdint>
#include <random>
#include <vector>

#include "tests/support/recordings.h"

namespace orvalis::test {

enum class NoiseColour { kWhite, kPink };

/// Gaussian noise of unit power, the same for the same seed. Pink: -3 dB an octave within 0.5 dB,
/// by three poles.
inline std::vector<double> unit_noise(std::size_t samples, NoiseColour colour, unsigned seed) {
  std::mt19937 generator(seed);
  std::normal_distribution<double> gaussian;
  std::vector<double> noise(samples);
  double low = 0, middle = 0, high = 0, power = 0;
  for (double &value : noise) {
    const double white = gaussian(generator);
    low = 0.99765 * low + 0.0990460 * white;
    middle = 0.96300 * middle + 0.2965164 * white;
    high = 0.57000 * high + 1.0526913 * white;
    value = colour == NoiseColour::kWhite ? white : low + middle + high + 0.1848 * white;
    power += value * value;
  }
  const double scale = 1 / std::sqrt(power / static_cast<double>(samples));
  for (double &value : noise) value *= scale;
  return noise;
}

inline std::int16_t to_sample(double value) {
  return static_cast<std::int16_t>(std::lrint(std::clamp(value, -32768.0, 32767.0)));
}

/// Level of each whole frame in dB; full-scale square wave is 90.3.
inline std::vector<double> frame_levels(const Pcm &pcm, std::size_t frame_samples) {
  std::vector<double> levels;
  for (std::size_t at = 0; at + frame_samples <= pcm.size(); at += frame_samples) {
    double power = 1e-3;
    for (std::size_t i = at; i < at + frame_samples; ++i) power += double(pcm[i]) * pcm[i];
    levels.push_back(10 * std::log10(power / static_cast<double>(frame_samples)));
  }
  return levels;
}

/// Mean level of the frames within 30 dB of the loudest one.
inline double speech_level(const Pcm &pcm, std::int32_t rate_hz) {
  const auto levels = frame_levels(pcm, static_cast<std::size_t>(rate_hz / 100));
  const double threshold = *std::max_element(levels.begin(), levels.end()) - 30;
  double power = 0;
  int frames = 0;
  for (const double level : levels) {
    if (level < threshold) continue;
    power += std::pow(10, level / 10);
    ++frames;
  }
  return 10 * std::log10(power / frames);
}

/// The recording with noise `below_db` under its speech and `margin` samples of that noise around.
inline Pcm in_noise(const Pcm &speech, std::size_t margin, NoiseColour colour, double level_db) {
  const auto noise = unit_noise(speech.size() + 2 * margin, colour, 20260705);
  const double scale = std::pow(10, level_db / 20);
  Pcm mixed(noise.size());
  for (std::size_t i = 0; i < mixed.size(); ++i) {
    const bool inside = i >= margin && i < margin + speech.size();
    mixed[i] = to_sample(scale * noise[i] + (inside ? speech[i - margin] : 0));
  }
  return mixed;
}

}  // namespace orvalis::test
