// What the services are measured on: speech for what a frame costs, and signals of many kinds for
// how much more the worst one costs.
#pragma once

#include <algorithm>
#include <cmath>
#include <cstdint>
#include <numbers>
#include <random>
#include <vector>

#include "bench/services.h"
#include "tests/support/recordings.h"

namespace orvalis::bench {

using test::Pcm;

/// Audio in whole frames, the samples of two microphones in turn.
struct Signal {
  const char *name;
  Pcm pcm;
  std::size_t frame_samples;

  std::size_t frames() const { return pcm.size() / frame_samples; }
  const std::int16_t *frame(std::size_t number) const {
    return &pcm[number % frames() * frame_samples];
  }
};

inline Pcm recorded_speech(int rate_hz) {
  Pcm speech;
  const auto append = [&speech](const Pcm &more) {
    speech.insert(speech.end(), more.begin(), more.end());
  };
  if (rate_hz == 16000) {
    for (const char *name : test::kSentences) append(test::speech_16k(name));
  } else {
    append(test::speech_8k("raw/hts1a.raw"));
    append(test::speech_8k("wav/vk5qi.wav"));
  }
  return speech;
}

/// `first` as a service hears it; a second microphone hears it three samples later and 6 dB weaker,
/// with noise of its own unless there is silence. The last microphone dies at a sample.
inline Signal heard_by(const ServiceKind &kind, const char *name, const Pcm &first,
                       std::size_t dies_at = SIZE_MAX) {
  Signal signal{name, {}, static_cast<std::size_t>(kind.rate_hz / 100 * kind.microphones)};
  std::minstd_rand random;
  for (std::size_t i = 0; i < first.size(); ++i) {
    const bool alive = i < dies_at;
    if (kind.microphones == 1) {
      signal.pcm.push_back(alive ? first[i] : std::int16_t{0});
      continue;
    }
    const int late = first[std::max<std::size_t>(i, 3) - 3] / 2;
    const int noise = first[i] == 0 ? 0 : static_cast<int>(random() % 41) - 20;
    signal.pcm.push_back(first[i]);
    signal.pcm.push_back(static_cast<std::int16_t>(alive ? late + noise : 0));
  }
  return signal;
}

inline Signal speech_for(const ServiceKind &kind) {
  return heard_by(kind, "speech", recorded_speech(kind.rate_hz));
}

/// Six seconds of each kind of signal.
inline std::vector<Signal> signals_for(const ServiceKind &kind) {
  Pcm speech = recorded_speech(kind.rate_hz);
  const std::size_t second = static_cast<std::size_t>(kind.rate_hz);
  const std::size_t frame = second / 100;
  speech.resize(6 * second);
  std::vector<Signal> signals;
  std::minstd_rand random;
  const auto add = [&](const char *name, auto sample) {
    Pcm pcm;
    for (std::size_t i = 0; i < speech.size(); ++i)
      pcm.push_back(static_cast<std::int16_t>(std::clamp<long>(sample(i), INT16_MIN, INT16_MAX)));
    signals.push_back(heard_by(kind, name, pcm));
  };
  const auto noise = [&random](long peak) {
    return static_cast<long>(random() >> 4) % (2 * peak + 1) - peak;
  };
  const auto tone = [](double turns) {
    return std::lrint(32767 * std::sin(2 * std::numbers::pi * turns));
  };
  add("speech", [&](std::size_t i) { return long{speech[i]}; });
  add("quiet speech", [&](std::size_t i) { return long{speech[i]} / 16; });
  add("clipped speech", [&](std::size_t i) { return long{speech[i]} * 40; });
  add("speech in noise", [&](std::size_t i) { return speech[i] + noise(1000); });
  add("silence", [](std::size_t) { return 0L; });
  add("small noise", [&](std::size_t) { return noise(4); });
  add("steady noise", [&](std::size_t) { return noise(1000); });
  add("full-scale noise", [&](std::size_t) { return noise(32767); });
  add("DC", [](std::size_t) { return 10000L; });
  add("impulses", [](std::size_t i) { return i % 20 == 0 ? 32767L : 0L; });
  add("alternating extremes", [](std::size_t i) { return i % 2 == 0 ? 32767L : -32768L; });
  add("square wave", [&](std::size_t i) { return i / (frame / 4) % 2 == 0 ? 32767L : -32768L; });
  add("noise and quiet in turn",
      [&](std::size_t i) { return noise(i / frame % 2 == 0 ? 20000 : 20); });
  add("level jumps", [&](std::size_t i) { return noise(8L << (i / (10 * frame)) % 13); });
  add("sine", [&](std::size_t i) { return tone(0.0637 * static_cast<double>(i)); });
  add("sweep", [&](std::size_t i) {
    const double at = static_cast<double>(i) / static_cast<double>(speech.size());
    return tone(at * at * static_cast<double>(speech.size()) / 4);
  });
  signals.push_back(heard_by(kind, "a microphone that dies", speech, 7 * speech.size() / 12));
  return signals;
}

}  // namespace orvalis::bench
