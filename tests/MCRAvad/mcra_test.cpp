// The MCRA detector: its formulas as published, and how much of the words and of the pauses of real
// recordings in noise it takes for speech.
#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <cstdio>
#include <memory>

#include "Voice_Engine/MCRAvad/speech_presence.h"
#include "tests/support/noise.h"

namespace orvalis::test {
namespace {

/// One step of a bin from chosen powers and history.
TEST(Mcra, SnrGainAndProbabilityAreThePublishedOnes) {
  const auto vad = std::make_unique<VADINFO>();
  for (int step = 0; step < 400; ++step) {
    const bool is_first = step % 2 == 0;
    vad->frameIndex = !is_first;
    const double posterior = std::pow(10, step / 200.0 - 0.5);  // to 15 dB
    for (int k = 0; k < MCRA_BINS; ++k) {
      vad->noisePower[k] = 1 << 24;
      vad->smoothedPeriodogram[k] = std::llrint(posterior * (1 << 24));
      vad->gain[k] = 32768 * k / 127;
      vad->postSnr[k] = 1024 * 8;
      vad->prioriSnr[k] = vad->prioriSnrAvg[k] = 0;
    }
    update_presence(*vad);
    for (int k = 0; k < MCRA_BINS; ++k) {
      const double carried = is_first ? 0 : 0.92 * std::pow(k / 127.0, 2) * 8;
      const double prior = 0.08 * std::max(posterior - 1, 0.0) + carried;
      const double xi = vad->prioriSnr[k] / 4096.0, v = posterior * xi / (1 + xi);
      ASSERT_NEAR(xi, prior, 2e-3 + 1e-3 * prior);
      const double gain = xi / (1 + xi) * std::exp(-0.5 * std::expint(-v));
      ASSERT_NEAR(vad->gain[k] / 32768.0, gain, v > 0.05 ? 1e-3 + 0.002 * gain : 1)
          << posterior << ' ' << xi;
      // Without SNR around it q is 0.95. What is up to 0.051 counts as 0.
      const double odds = 19 * (1 + xi) * std::exp(-v);
      const double p = is_first ? std::min(1.0, 18 / (2 + odds)) : 1 / (1 + odds);
      const double got = vad->speechProb[k] / 0x1p31;
      ASSERT_NEAR(got, got == 0 && p < 0.0511 ? 0 : p, 0.004);
      ASSERT_TRUE(got == 0 || got >= 0.051);
    }
  }
}

std::vector<bool> decisions_on(Pcm pcm, bool keeps_history) {
  const auto record = std::make_unique<VADINFO>();
  VADINFO *vad = record.get();
  initialVADINFO(&vad);
  vad->historyUpdate = keeps_history;
  std::vector<bool> decisions;
  for (std::size_t at = 0; at + 160 <= pcm.size(); at += 160)
    decisions.push_back(processVAD(&vad, &pcm[at], 160, 0.84F) == 1);
  return decisions;
}

/// Counts frames, and those decided to be speech, of words (within 20 dB of the loudest frame) and
/// of pauses (nothing within 40 dB of it for 0.15 s around).
struct Rates {
  /// Takes a recording under noise `below_db` quieter than it is.
  void take(const Pcm &speech, int rate_hz, NoiseColour colour, double below_db, bool history) {
    constexpr int kMargin = 150, kAround = 15;  // frames
    const auto decisions = decisions_on(
        in_noise(speech, 160 * kMargin, colour, speech_level(speech, rate_hz) - below_db), history);
    auto levels = frame_levels(speech, 160);
    const double loudest = *std::ranges::max_element(levels);
    levels.insert(levels.begin(), kMargin, -99);
    levels.resize(decisions.size() + kAround, -99);
    for (std::size_t i = kAround; i < decisions.size(); ++i) {
      const double around = *std::max_element(&levels[i - kAround], &levels[i + kAround]);
      if (levels[i] >= loudest - 20) ++words, covered += decisions[i];
      if (around < loudest - 40) ++pauses, mistaken += decisions[i];
    }
  }
  double words_percent() const { return 100.0 * covered / words; }
  double pauses_percent() const { return 100.0 * mistaken / pauses; }
  int words = 0, covered = 0, pauses = 0, mistaken = 0;
};

TEST(McraRecordings, WordsAreCoveredAndPausesAreNot) {
  std::vector<Pcm> recordings;
  for (const char *name : kSentences) recordings.push_back(speech_16k(name));
  for (const char *name : {"001", "002", "003", "004", "005"})
    recordings.push_back(speech_16k(std::string("cards/") + name + ".wav"));
  const struct {
    double below_db, min_words[2];  // in percent, without and with history
  } conditions[] = {{60, {99, 75}}, {20, {98, 60}}, {10, {80, 33}}, {5, {52, 15}}};
  std::printf("noise           words  pauses    the same with history\n");
  for (const auto &[below_db, min_words] : conditions) {
    for (const auto colour : {NoiseColour::kWhite, NoiseColour::kPink}) {
      std::printf("%-5s %2.0f dB", colour == NoiseColour::kWhite ? "white" : "pink", below_db);
      for (const bool history : {false, true}) {
        Rates rates;
        for (const Pcm &speech : recordings) rates.take(speech, 16000, colour, below_db, history);
        std::printf("   %5.1f %% %5.2f %%%s", rates.words_percent(), rates.pauses_percent(),
                    history ? "\n" : "");
        EXPECT_GT(rates.words_percent(), min_words[history]) << below_db;
        EXPECT_LT(rates.pauses_percent(), 0.1) << below_db;
        EXPECT_GT(rates.pauses, 2000);
      }
    }
  }
  for (const char *name : {"wav/hts1a.wav", "wav/vk5qi.wav"}) {
    Rates rates;
    rates.take(speech_8k(name), 8000, NoiseColour::kPink, 20, false);
    EXPECT_GT(rates.words_percent(), 90) << name;
    EXPECT_LT(rates.pauses_percent(), 1) << name;
  }
}

TEST(McraRecordings, LouderNoiseIsLearntOnlyWithHistory) {
  Pcm pcm;
  for (const double x : unit_noise(16000 * 20, NoiseColour::kPink, 20260712))
    pcm.push_back(to_sample((pcm.size() < 80000 ? 100 : 316) * x));  // 10 dB more after 5 s
  for (const bool history : {false, true}) {
    const auto decisions = decisions_on(pcm, history);
    const auto count = [&](int from, int to) {
      return std::count(decisions.begin() + from, decisions.begin() + to, true);
    };
    EXPECT_EQ(count(0, 500), 0);
    EXPECT_GT(count(500, 600), 50);
    EXPECT_TRUE(history ? count(1000, 2000) == 0 : count(1000, 2000) > 950);
  }
}

}  // namespace
}  // namespace orvalis::test
