// Audio that no microphone gives but any host may pass, the same for the same seed. Made of
// integers only, so that it depends on no library's rounding.
#pragma once

#include <algorithm>
#include <cstdint>
#include <random>

#include "tests/support/recordings.h"

namespace orvalis::test {

using Random = std::mt19937_64;

/// How a sequence makes its calls: at random where it is hostile.
struct Caller {
  Random random;
  bool hostile;
};

/// A number from first to last.
inline std::int64_t draw(Random &random, std::int64_t first, std::int64_t last) {
  return first + static_cast<std::int64_t>(random() % static_cast<std::uint64_t>(last - first + 1));
}

/// One of the values.
template <class Value>
Value pick(Random &random, std::initializer_list<Value> values) {
  return values.begin()[draw(random, 0, static_cast<std::int64_t>(values.size()) - 1)];
}

inline std::int16_t clipped(std::int64_t sample) {
  return static_cast<std::int16_t>(std::clamp<std::int64_t>(sample, INT16_MIN, INT16_MAX));
}

/// Stretches of speech, louder, softer and clipped, and of everything that is not speech.
inline Pcm hostile_signal(std::uint64_t seed, std::size_t samples, const Pcm &speech) {
  Random random(seed);
  Pcm signal;
  while (signal.size() < samples) {
    const auto kind = draw(random, 0, 17);
    const std::int64_t level = std::int64_t{1} << draw(random, 0, 15);
    const auto period = draw(random, 1, 80);
    // Some end on the grid of frames, speech is long enough to be an utterance.
    auto length = draw(random, 20, 3000);
    if (kind < 6) length = draw(random, 6000, 16000);
    if (draw(random, 0, 3) == 0) length -= length % 80;
    const auto from =
        static_cast<std::size_t>(draw(random, 0, static_cast<std::int64_t>(speech.size()) - 16000));
    for (std::int64_t i = 0; i < length; ++i) {
      const std::int64_t said = speech[from + static_cast<std::size_t>(i)];
      const std::int64_t noise = draw(random, -level, level);
      const bool odd = i / period % 2 == 1;
      std::int64_t sample = 0;
      switch (kind) {
        case 0:
        case 1:
          sample = said;
          break;
        case 2:
          sample = said + noise / 8;
          break;
        case 3:
          sample = said / 8;
          break;
        case 4:
          sample = 4 * said;
          break;
        case 5:
          sample = 40 * said;
          break;
        case 6:
          break;  // silence
        case 7:
          sample = i % draw(random, 59, 63) == 0 ? level : 0;
          break;  // nearly null audio
        case 8:
          sample = draw(random, -5, 5);
          break;  // abnormally small
        case 9:
          sample = level;
          break;  // DC
        case 10:
          sample = i % period == 0 ? -level : 1;
          break;  // impulses
        case 11:
          sample = noise;
          break;
        case 12:
          sample = noise >> std::min<std::int64_t>(i / 100, 14);
          break;  // fading
        case 13:
          sample = odd ? INT16_MIN : INT16_MAX;
          break;
        case 14:
          sample = i % 2 == 0 ? INT16_MIN : INT16_MAX;
          break;
        case 15:
          sample = INT16_MIN;
          break;
        case 16:
          sample = odd ? -level : level - 1;
          break;
        default:
          sample = i * i * period / 50 % (2 * level) - level;  // a chirp
      }
      signal.push_back(clipped(sample));
    }
  }
  signal.resize(samples);
  return signal;
}

}  // namespace orvalis::test
