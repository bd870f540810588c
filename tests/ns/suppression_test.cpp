// What the suppressors do to noise and speech, measured on mixtures of real speech, and that
// the one for two microphones survives whatever they do.
#include <gtest/gtest.h>

#include <climits>
#include <cmath>
#include <functional>
#include <memory>
#include <random>

#include "Voice_Engine/ns/s1chns.h"
#include "Voice_Engine/ns/s2chns.h"
#include "tests/support/noise.h"

namespace orvalis::test {
namespace {

/// By how many dB mode 0, 2 or 3 lowers audio after the first second.
double loss_db(Word16 mode, const Pcm &audio) {
  S1chnsState state{};
  Flags flags;
  S1CHNSInit(&state, mode);
  double before = 0, after = 0;
  for (std::size_t at = 0; at + 160 <= audio.size(); at += 160) {
    Pcm in(&audio[at], &audio[at] + 160), out(160);
    s1chns_C(flags, &state, in.data(), out.data());
    EXPECT_EQ(in, out) << "the input is overwritten with the output";
    for (std::size_t i = 0; at >= 16000 && i < 160; ++i) {
      before += 1.0 * audio[at + i] * audio[at + i];
      after += 1.0 * out[i] * out[i];
    }
  }
  return 10 * std::log10(before / after);
}

TEST(OneMicrophone, LowersWhiteNoiseToTheFloor) {
  for (const auto &[mode, floor_db] : {std::pair<Word16, double>{0, 13}, {2, 18.4}, {3, 6}}) {
    for (const double rms : {300.0, 800.0, 2000.0}) {
      Pcm noise;
      for (const double x : unit_noise(80000, NoiseColour::kWhite, 1))
        noise.push_back(to_sample(rms * x));
      EXPECT_NEAR(loss_db(mode, noise), floor_db, 1) << mode << ", rms " << rms;
    }
  }
}

// ---- Two microphones ----

/// An hour of disturbances in a plain build, seconds where every step is checked or emulated.
constexpr bool kHasTime = ORVALIS_TESTS_HAVE_TIME;

constexpr int kRate = 16000;
constexpr int kLearning = 4 * kRate;  // noise alone before the speech

using Signal = std::vector<double>;

Pcm interleaved(const Signal &first, const Signal &second) {
  Pcm pairs;
  for (std::size_t i = 0; i < first.size(); ++i) {
    pairs.push_back(to_sample(first[i]));
    pairs.push_back(to_sample(second[i]));
  }
  return pairs;
}

/// One channel of the output for whole frames. Nothing in the state is ever infinite or not a
/// number.
Signal suppressed(S2chnsState &state, const Pcm &pairs) {
  Signal output;
  Pcm frame(2 * kHop);
  for (std::size_t at = 0; at + 2 * kHop <= pairs.size(); at += 2 * kHop) {
    EXPECT_EQ(S2CHNSProcessNSFrame(state, &pairs[at], frame.data(), kHop), 0);
    for (int i = 0; i < kHop; ++i) output.push_back(frame[2 * i]);
    // The sum of finite values times 0 is 0, that of others is not a number.
    float sum = 0;
    for (const Matrices *covariance : {&state.Phi_yy, &state.Phi_vv})
      for (int i = 0; i < 4 * kTransformBins; ++i)
        sum += 0 * (covariance->re[i] + covariance->im[i]);
    for (const float probability : state.spp_prev) sum += 0 * probability;
    for (const float sample : state.overlap_tail) sum += 0 * sample;
    EXPECT_EQ(sum, 0) << "not finite after pair " << at / 2;
  }
  return output;
}

double power_of(const Signal &signal, int from = 0, int to = INT_MAX) {
  double sum = 0;
  to = std::min(to, static_cast<int>(signal.size()));
  for (int i = from; i < to; ++i) sum += signal[i] * signal[i];
  return sum / (to - from);
}

double db(double ratio) { return 10 * std::log10(ratio); }

struct Measured {
  double noise_change_db;   ///< in the pause, after two seconds
  double speech_change_db;  ///< of the part of the output that is the speech
  double snr_change_db;     ///< all that is not the speech counts as noise
};

Measured measure(NoiseColour colour, bool directional, double snr_db) {
  Signal speech(kLearning);  // silence to learn the noise in, then three sentences
  for (const int i : {0, 1, 3})
    for (const Word16 sample : speech_16k(kSentences[i])) speech.push_back(0.7 * sample);
  speech.resize(speech.size() / kHop * kHop);
  const int end = static_cast<int>(speech.size()) - kHop;
  const double scale = std::sqrt(power_of(speech, kLearning) / std::pow(10, snr_db / 10));
  // A directional source reaches both microphones, over a little noise of their own.
  const double shared = directional ? std::sqrt(0.9) : 0, single = std::sqrt(1 - shared * shared);
  const Signal own = unit_noise(speech.size(), colour, 1);
  const Signal other = unit_noise(speech.size(), colour, 2);
  const Signal source = unit_noise(speech.size(), colour, 3);
  Signal noise(speech.size()), first = speech, second(speech.size());
  for (std::size_t i = 0; i < speech.size(); ++i) {
    noise[i] = scale * (shared * source[i] + single * own[i]);
    first[i] += noise[i];
    second[i] = 0.8 * (i < 3 ? 0 : speech[i - 3]) +
                scale * (shared * 0.9 * (i < 5 ? 0 : source[i - 5]) + single * other[i]);
  }
  const auto state = std::make_unique<S2chnsState>();
  Signal output = suppressed(*state, interleaved(first, second));
  output.erase(output.begin(), output.begin() + kHop);  // the delay
  double product = 0;
  for (int i = kLearning; i < end; ++i) product += speech[i] * output[i];
  const double energy = power_of(speech, kLearning, end) * (end - kLearning);
  const double gain = product / energy;
  Signal rest = output;
  for (int i = kLearning; i < end; ++i) rest[i] -= gain * speech[i];
  return {db(power_of(output, 2 * kRate, kLearning - kHop) /
             power_of(noise, 2 * kRate, kLearning - kHop)),
          2 * db(gain),
          db(gain * gain * power_of(speech, kLearning, end) / power_of(rest, kLearning, end)) -
              db(power_of(speech, kLearning, end) / power_of(noise, kLearning, end))};
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
  Signal first = unit_noise(kRate, NoiseColour::kWhite, 4);
  Signal second = unit_noise(kRate, NoiseColour::kWhite, 5);
  for (Signal *signal : {&first, &second})
    for (double &sample : *signal) sample *= 500;
  return interleaved(first, second);
}

TEST(TwoMicrophones, RecoverFromWhateverComesIn) {
  const Pcm calm = noisy_second();
  /// The level of the last of some seconds.
  const auto level_after = [](int seconds, S2chnsState &state, const Pcm &pairs) {
    Signal output;
    while (seconds-- > 0) output = suppressed(state, pairs);
    return db(power_of(output));
  };
  const auto undisturbed = std::make_unique<S2chnsState>();
  const double expected_db = level_after(8, *undisturbed, calm);
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
    level_after(3, *state, calm);
    level_after(kHasTime ? 400 : 3, *state, storm);
    // The noise of a bin that looks like speech is learnt slowly: it takes a minute at worst.
    const double level_db = level_after(kHasTime ? 60 : 2, *state, calm);
    EXPECT_NEAR(level_db, expected_db, kHasTime ? 0.5 : HUGE_VAL);
  }
}

}  // namespace
}  // namespace orvalis::test
