// What the two-microphone suppressor does to speech and noise, measured on mixtures of real speech,
// and that it survives whatever its microphones do.
#include <gtest/gtest.h>

#include <cmath>
#include <cstring>
#include <functional>
#include <memory>
#include <numeric>
#include <random>
#include <utility>

#include "Voice_Engine/ns/s2chns.h"
#include "Voice_Engine/platform/fused.h"
#include "tests/support/noise.h"
#include "tests/support/recordings.h"

namespace orvalis::test {
namespace {

/// An hour of disturbances in a plain build, seconds where every step is checked or emulated.
constexpr bool kHasTime = ORVALIS_TESTS_HAVE_TIME;

constexpr int kRate = 16000;
constexpr int kLearning = 4 * kRate;  // noise alone before the speech
constexpr int kDelay = kHop;
constexpr int kMicDelay = 3;  // samples from the first microphone to the second
constexpr double kMicGain = 0.8;

using Signal = std::vector<double>;

/// Runs whole frames of interleaved pairs and returns one channel of the output. Holds that nothing
/// in the state is ever infinite or not a number.
Pcm suppressed(S2chnsState &state, const Pcm &pairs) {
  Pcm output(pairs.size() / 2), frame(2 * kHop);
  const auto is_finite = [](const auto &values) {
    // The sum of finite values times 0 is 0, that of others is not a number.
    return std::accumulate(std::begin(values), std::end(values), 0.0F,
                           [](float sum, float value) { return sum + 0 * value; }) == 0;
  };
  for (std::size_t at = 0; at + 2 * kHop <= pairs.size(); at += 2 * kHop) {
    EXPECT_EQ(S2CHNSProcessNSFrame(state, &pairs[at], frame.data(), kHop), 0);
    for (int i = 0; i < kHop; ++i) output[at / 2 + i] = frame[2 * i];
    if (!is_finite(state.Phi_yy.re) || !is_finite(state.Phi_yy.im) || !is_finite(state.Phi_vv.re) ||
        !is_finite(state.Phi_vv.im) || !is_finite(state.spp_prev) ||
        !is_finite(state.overlap_tail)) {
      ADD_FAILURE() << "not finite after pair " << at / 2;
      break;
    }
  }
  return output;
}

Pcm suppressed(const Pcm &pairs) {
  const auto state = std::make_unique<S2chnsState>();
  return suppressed(*state, pairs);
}

/// A signal at the second microphone: later, and weaker.
Signal at_second(const Signal &first, int delay, double gain) {
  Signal second(first.size());
  for (std::size_t i = delay; i < first.size(); ++i) second[i] = gain * first[i - delay];
  return second;
}

double power_of(const Signal &signal, std::size_t from = 0) {
  double sum = 0;
  for (std::size_t i = from; i < signal.size(); ++i) sum += signal[i] * signal[i];
  return sum / static_cast<double>(signal.size() - from);
}

double db(double ratio) { return 10 * std::log10(ratio); }

/// Silence to learn the noise in, then three sentences.
Signal spoken() {
  Signal speech(kLearning);
  for (int i : {0, 1, 3})
    for (const Word16 sample : speech_16k(kSentences[i])) speech.push_back(0.7 * sample);
  speech.resize(speech.size() / kHop * kHop);
  return speech;
}

struct Measured {
  double noise_change_db;   ///< in the pause, after two seconds
  double speech_change_db;  ///< of the part of the output that is the speech
  double snr_change_db;     ///< all that is not the speech counts as noise
};

Measured measure(NoiseColour colour, bool directional, double snr_db) {
  const Signal speech = spoken();
  const double scale = std::sqrt(power_of(speech, kLearning) / std::pow(10, snr_db / 10));
  const Signal own = unit_noise(speech.size(), colour, 1);
  const Signal other = unit_noise(speech.size(), colour, 2);
  // A directional source reaches both microphones, over a little noise of their own.
  const double shared = directional ? std::sqrt(0.9) : 0;
  const double single = std::sqrt(1 - shared * shared);
  const Signal source = unit_noise(speech.size(), colour, 3);
  const Signal source2 = at_second(source, 5, 0.9);
  const Signal speech2 = at_second(speech, kMicDelay, kMicGain);
  Pcm pairs;
  Signal noise(speech.size());
  for (std::size_t i = 0; i < speech.size(); ++i) {
    noise[i] = scale * (shared * source[i] + single * own[i]);
    pairs.push_back(to_sample(speech[i] + noise[i]));
    pairs.push_back(to_sample(speech2[i] + scale * (shared * source2[i] + single * other[i])));
  }
  const Pcm output = suppressed(pairs);

  const auto pause_power = [&](auto sample_at) {
    double sum = 0;
    for (int i = 2 * kRate; i < kLearning - kDelay; ++i) sum += sample_at(i) * sample_at(i);
    return sum;
  };
  double product = 0, energy = 0;
  for (std::size_t i = kLearning; i + kDelay < speech.size(); ++i) {
    product += speech[i] * output[i + kDelay];
    energy += speech[i] * speech[i];
  }
  const double gain = product / energy;
  double rest = 0, noise_energy = 0;
  for (std::size_t i = kLearning; i + kDelay < speech.size(); ++i) {
    rest += std::pow(output[i + kDelay] - gain * speech[i], 2);
    noise_energy += noise[i] * noise[i];
  }
  return {db(pause_power([&](int i) { return double(output[i + kDelay]); }) /
             pause_power([&](int i) { return noise[i]; })),
          2 * db(gain), db(gain * gain * energy / rest) - db(energy / noise_energy)};
}

TEST(TwoMicrophones, LowerNoiseAndKeepSpeech) {
  for (const bool pink : {false, true}) {
    for (const bool directional : {false, true}) {
      for (const double snr_db : {0.0, 5.0, 10.0}) {
        const auto colour = pink ? NoiseColour::kPink : NoiseColour::kWhite;
        const Measured m = measure(colour, directional, snr_db);
        SCOPED_TRACE(testing::Message()
                     << (pink ? "pink, " : "white, ")
                     << (directional ? "directional, " : "independent, ") << snr_db << " dB");
        std::printf("%-5s %-11s %2g dB: noise %.1f dB, speech %.1f dB, all else %+.1f dB\n",
                    pink ? "pink" : "white", directional ? "directional" : "independent", snr_db,
                    m.noise_change_db, m.speech_change_db, m.snr_change_db);
        EXPECT_LE(m.noise_change_db, -11);
        EXPECT_GE(m.speech_change_db, snr_db == 10 ? -1.5 : pink ? -4.5 : -3);
        EXPECT_LE(m.speech_change_db, 0);
        EXPECT_GE(m.speech_change_db - m.noise_change_db, 9) << "speech over the noise in pauses";
        EXPECT_GE(m.snr_change_db, 1.5) << "over noise and distortion while it is spoken";
      }
    }
  }
}

/// Noise of both microphones, a second of it, of an rms of 500.
Pcm noisy_second() {
  const Signal first = unit_noise(kRate, NoiseColour::kWhite, 4);
  const Signal second = unit_noise(kRate, NoiseColour::kWhite, 5);
  Pcm pairs;
  for (int i = 0; i < kRate; ++i) {
    pairs.push_back(to_sample(500 * first[i]));
    pairs.push_back(to_sample(500 * second[i]));
  }
  return pairs;
}

double level_of(const Pcm &samples) { return db(power_of({samples.begin(), samples.end()})); }

TEST(TwoMicrophones, RecoverFromWhateverComesIn) {
  const Pcm calm = noisy_second();
  const auto seconds = [](int count, S2chnsState &state, const Pcm &pairs) {
    Pcm output;
    while (count-- > 0) output = suppressed(state, pairs);
    return output;
  };
  const auto undisturbed = std::make_unique<S2chnsState>();
  const double expected_db = level_of(seconds(8, *undisturbed, calm));
  EXPECT_NEAR(expected_db, db(500.0 * 500) - 12, 1);

  std::mt19937 generator(6);
  // (sample number, the calm sample) to the disturbed one; even numbers are the first microphone
  using Disturbance = std::function<int(int, int)>;
  const std::pair<const char *, Disturbance> disturbances[] = {
      {"silence", [](int, int) { return 0; }},
      {"full scale", [](int i, int) { return i / 2 % 40 < 20 ? 32767 : -32768; }},
      {"full-scale noise", [&](int, int) { return int(generator() % 65536) - 32768; }},
      {"identical channels", [&](int i, int) { return calm[i / 2 * 2]; }},
      {"constant", [](int, int) { return -32768; }},
      {"first microphone dead", [](int i, int x) { return i % 2 == 0 ? 0 : x; }},
      {"second microphone dead", [](int i, int x) { return i % 2 == 1 ? 0 : x; }},
      {"alternating", [](int i, int x) { return i / 3200 % 2 == 0 ? 0 : 8 * x; }},
      {"one impulse", [](int i, int) { return i % 20000 == 0 ? 32767 : 20; }},
  };
  for (const auto &[name, disturbed] : disturbances) {
    SCOPED_TRACE(name);
    Pcm storm(calm.size());
    for (int i = 0; i < static_cast<int>(calm.size()); ++i)
      storm[i] = static_cast<Word16>(std::clamp(disturbed(i, calm[i]), -32768, 32767));
    const auto state = std::make_unique<S2chnsState>();
    seconds(3, *state, calm);
    seconds(kHasTime ? 400 : 3, *state, storm);
    // The noise of a bin that looks like speech is learnt slowly: it takes a minute at worst.
    if (!kHasTime) {
      seconds(2, *state, calm);
    } else {
      EXPECT_NEAR(level_of(seconds(60, *state, calm)), expected_db, 0.5);
    }
  }
}

TEST(TwoMicrophones, BothBodiesGiveTheSameBits) {
  if (!has_fma()) GTEST_SKIP() << "there is one body only";
  const auto portable = std::make_unique<S2chnsState>();
  const auto fused = std::make_unique<S2chnsState>();
  const Pcm speech = speech_16k(kSentences[2]);
  const Pcm noise = noisy_second();
  Pcm in(2 * kHop), out(2 * kHop), other(2 * kHop);
  for (std::size_t at = 0; at + kHop < speech.size(); at += kHop) {
    for (int i = 0; i < 2 * kHop; ++i)
      in[i] = static_cast<Word16>(speech[at + i / 2] / 2 + noise[(2 * at + i) % noise.size()] / 2);
    s2chns_frame_portable(*portable, in.data(), out.data());
    s2chns_frame_fused(*fused, in.data(), other.data());
    ASSERT_EQ(out, other);
    ASSERT_EQ(std::memcmp(portable.get(), fused.get(), sizeof *fused), 0) << "at sample " << at;
  }
}

}  // namespace
}  // namespace orvalis::test
