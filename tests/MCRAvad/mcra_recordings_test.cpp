// The detector on real recordings in noise: how much of the words and of the pauses it takes for
// speech.
#include <gtest/gtest.h>

#include <algorithm>
#include <cstdio>
#include <memory>

#include "Voice_Engine/MCRAvad/MCRAvad.h"
#include "tests/support/noise.h"

namespace orvalis::test {
namespace {

constexpr std::size_t kFrame = MCRA_FRAME_SAMPLES;

std::vector<bool> decisions_on(Pcm pcm, std::int32_t keeps_history) {
  const auto record = std::make_unique<VADINFO>();
  VADINFO *vad = record.get();
  initialVADINFO(&vad);
  vad->historyUpdate = keeps_history;
  std::vector<bool> decisions;
  for (std::size_t at = 0; at + kFrame <= pcm.size(); at += kFrame)
    decisions.push_back(processVAD(&vad, &pcm[at], kFrame, 0.84F) == 1);
  return decisions;
}

/// Frames, and how many of them were decided to be speech.
struct Share {
  int frames = 0;
  int speech = 0;
  void take(bool decision) {
    ++frames;
    speech += decision;
  }
  double percent() const { return 100.0 * speech / frames; }
};

struct Rates {
  Share words;   // within 20 dB of the loudest frame
  Share pauses;  // nothing within 40 dB of it for 0.15 s around
};

void rate(const Pcm &speech, const Pcm &mixed, std::size_t margin, bool keeps_history,
          Rates &rates) {
  constexpr std::size_t kAround = 15;
  const auto levels = frame_levels(speech, kFrame);
  const double loudest = *std::max_element(levels.begin(), levels.end());
  const auto level_at = [&](std::size_t frame) {
    const std::size_t lead = margin / kFrame;
    return frame >= lead && frame - lead < levels.size() ? levels[frame - lead] : -99;
  };
  const auto decisions = decisions_on(mixed, keeps_history);
  for (std::size_t i = kAround; i + kAround < decisions.size(); ++i) {
    double around = -99;
    for (std::size_t j = i - kAround; j <= i + kAround; ++j) around = std::max(around, level_at(j));
    if (level_at(i) >= loudest - 20) rates.words.take(decisions[i]);
    if (around < loudest - 40) rates.pauses.take(decisions[i]);
  }
}

TEST(McraRecordings, WordsAreCoveredAndPausesAreNot) {
  std::vector<Pcm> recordings;
  for (const char *name : kSentences) recordings.push_back(speech_16k(name));
  for (const char *name : {"001", "002", "003", "004", "005"})
    recordings.push_back(speech_16k(std::string("cards/") + name + ".wav"));
  struct Condition {
    double below_db;
    double min_words[2];  // in percent, by historyUpdate
  };
  const Condition kConditions[] = {{60, {99, 75}}, {20, {98, 60}}, {10, {80, 33}}, {5, {52, 15}}};
  constexpr std::size_t kMargin = 24000;
  std::printf("noise           words  pauses    the same with history\n");
  for (const auto &[below_db, min_words] : kConditions) {
    for (const auto colour : {NoiseColour::kWhite, NoiseColour::kPink}) {
      Rates rates[2];
      for (const Pcm &speech : recordings) {
        const Pcm mixed = in_noise(speech, kMargin, colour, speech_level(speech, 16000) - below_db);
        for (const bool keeps_history : {false, true})
          rate(speech, mixed, kMargin, keeps_history, rates[keeps_history]);
      }
      std::printf("%-5s %2.0f dB", colour == NoiseColour::kWhite ? "white" : "pink", below_db);
      for (const int history : {0, 1}) {
        std::printf("   %5.1f %% %5.2f %%", rates[history].words.percent(),
                    rates[history].pauses.percent());
        EXPECT_GT(rates[history].words.percent(), min_words[history]) << below_db;
        EXPECT_GT(rates[history].pauses.frames, 2000);
        EXPECT_LT(rates[history].pauses.percent(), 0.1) << below_db;
      }
      std::printf("\n");
    }
  }
}

TEST(McraRecordings, WordsAreCoveredAtBothRates) {
  for (const char *name : {"wav/hts1a.wav", "wav/vk5qi.wav"}) {
    const Pcm speech = speech_8k(name);
    Rates rates;
    const Pcm mixed = in_noise(speech, 16000, NoiseColour::kPink, speech_level(speech, 8000) - 20);
    rate(speech, mixed, 16000, false, rates);
    std::printf("%s: %.1f %% of the words, %.2f %% of the pauses\n", name, rates.words.percent(),
                rates.pauses.percent());
    EXPECT_GT(rates.words.percent(), 90);
    EXPECT_LT(rates.pauses.percent(), 1);
  }
}

TEST(McraRecordings, LouderNoiseIsLearntOnlyWithHistory) {
  const auto noise = unit_noise(16000 * 20, NoiseColour::kPink, 20260712);
  Pcm pcm(noise.size());
  for (std::size_t i = 0; i < pcm.size(); ++i)
    pcm[i] = to_sample((i < pcm.size() / 4 ? 100 : 316) * noise[i]);  // 10 dB more after 5 s
  for (const bool keeps_history : {false, true}) {
    const auto decisions = decisions_on(pcm, keeps_history);
    EXPECT_EQ(std::count(decisions.begin(), decisions.begin() + 500, true), 0);
    EXPECT_GT(std::count(decisions.begin() + 500, decisions.begin() + 600, true), 50);
    const auto later = std::count(decisions.begin() + 1000, decisions.end(), true);  // by 5 s
    EXPECT_TRUE(keeps_history ? later == 0 : later > 950) << later;
  }
}

}  // namespace
}  // namespace orvalis::test
