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

}  // namespace orvalis::test
