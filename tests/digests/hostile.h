// Audio that no microphone gives but any host may pass, the same for the same seed. Made of
// integers only, so that it depends on no library's rounding.
#pragma once

#include <algorithm>
#include <cstdint>
#include <random>

#include "tests/support/recordings.h"

namespace orvalis::test {

using Random = std::mt19937_64;

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

inline Pcm cut(const Pcm &audio, std::size_t at, std::size_t samples) {
  return {audio.begin() + static_cast<long>(at), audio.begin() + static_cast<long>(at + samples)};
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
    const Pcm said_now =
        cut(speech, static_cast<std::size_t>(draw(random, 0, std::ssize(speech) - 16000)), 16000);
    for (std::int64_t i = 0; i < length; ++i) {
      const std::int64_t said = said_now[static_cast<std::size_t>(i)];
      const std::int64_t noise = draw(random, -level, level);
      const std::int64_t small = kind == 8 ? draw(random, -5, 5) : 0;
      const std::int64_t gap = kind == 7 ? draw(random, 59, 63) : 60;
      const bool odd = i / period % 2 == 1;
      const std::int64_t sounds[] = {said,
                                     said,
                                     said + noise / 8,
                                     said / 8,
                                     4 * said,
                                     40 * said,
                                     0,                             // silence
                                     i % gap == 0 ? level : 0,      // nearly null audio
                                     small,                         // abnormally small
                                     level,                         // DC
                                     i % period == 0 ? -level : 1,  // impulses
                                     noise,
                                     noise >> std::min<std::int64_t>(i / 100, 14),  // fading
                                     odd ? INT16_MIN : INT16_MAX,
                                     i % 2 == 0 ? INT16_MIN : INT16_MAX,
                                     INT16_MIN,
                                     odd ? -level : level - 1,
                                     i * i * period / 50 % (2 * level) - level};  // a chirp
      signal.push_back(clipped(sounds[kind]));
    }
  }
  signal.resize(samples);
  return signal;
}

/// Visits every combination of one value of each list.
template <class Visit>
void cross(Visit visit) {
  visit();
}
template <class Visit, class List, class... Lists>
void cross(Visit visit, const List &first, const Lists &...rest) {
  for (const auto x : first) cross([&](auto... tail) { visit(x, tail...); }, rest...);
}

}  // namespace orvalis::test
