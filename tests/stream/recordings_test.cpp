// How much of the speech of real recordings lies in utterances, clean and in noise, judged by the
// recordings' own energy.
#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <cstdio>
#include <string>
#include <vector>

#include "jni/orvalis.h"
#include "stream/utterance_stream.h"
#include "tests/support/noise.h"
#include "tests/support/recordings.h"

namespace {

using namespace orvalis::test;

struct Span {
  double start_s, end_s;
};

std::vector<Span> utterances_of(const Pcm &pcm, const UtteranceSettings &settings) {
  UtteranceStream *stream = OpenUtteranceStream(&settings);
  const auto samples = static_cast<int32_t>(pcm.size());
  EXPECT_EQ(PushUtteranceAudio(stream, pcm.data(), samples), samples);
  FlushUtteranceStream(stream);
  std::vector<Span> spans;
  for (Utterance next; NextUtterance(stream, &next) == 1;)
    spans.push_back({double(next.start) / settings.rate_hz, double(next.end) / settings.rate_hz});
  CloseUtteranceStream(stream);
  return spans;
}

/// The default settings, and the MCRA detector as `orvalis vad` takes it.
UtteranceSettings settings_of(bool is_mcra, bool is_padded, bool has_lead_in = false) {
  UtteranceSettings settings = UTTERANCE_SETTINGS_DEFAULT;
  if (is_mcra) settings.detector = UTTERANCE_MCRA;
  if (is_mcra) settings.hangover_ms = 300, settings.min_speech_ms = 100;
  if (!is_padded) settings.pad_before_ms = settings.pad_after_ms = 0;
  settings.lead_in = has_lead_in;
  return settings;
}

/// Whether each frame of a recording is within 30 dB of the loudest.
std::vector<bool> speech_frames(const Pcm &speech) {
  const auto levels = frame_levels(speech, 160);
  const double threshold = *std::ranges::max_element(levels) - 30;
  std::vector<bool> is_speech;
  for (const double level : levels) is_speech.push_back(level >= threshold);
  return is_speech;
}

/// Sentences and spoken cards at 16 kHz.
std::vector<Pcm> ten_recordings() {
  std::vector<Pcm> recordings;
  for (const char *name : kSentences) recordings.push_back(speech_16k(name));
  for (const char number : {'1', '2', '3', '4', '5'})
    recordings.push_back(speech_16k(std::string("cards/00") + number + ".wav"));
  return recordings;
}

TEST(Recordings, ALeadInFindsTheFirstWordAndSpeechThroughout) {
  const auto share_found = [](const Pcm &pcm, const UtteranceSettings &settings) {
    double sum = 0;
    for (const auto &[start_s, end_s] : utterances_of(pcm, settings)) sum += end_s - start_s;
    return 16000 * sum / double(pcm.size());
  };
  const auto without = settings_of(false, false), with = settings_of(false, false, true);
  Pcm all;
  for (const Pcm &speech : ten_recordings()) {
    const auto late = utterances_of(speech, without), found = utterances_of(speech, with);
    ASSERT_EQ(late.size(), 1U);
    ASSERT_EQ(found.size(), 1U);
    EXPECT_DOUBLE_EQ(late[0].start_s, 0.39) << "the detector finds nothing before";
    EXPECT_LT(found[0].start_s, 0.30);
    EXPECT_NEAR(found[0].start_s, utterances_of(speech, settings_of(true, false))[0].start_s,
                0.135);
    EXPECT_NEAR(found[0].end_s, late[0].end_s, 0.025);

    Pcm dense;
    const auto is_speech = speech_frames(speech);
    for (std::size_t i = 0; i < is_speech.size(); ++i)
      if (is_speech[i]) dense.insert(dense.end(), &speech[160 * i], &speech[160 * i] + 160);
    all.insert(all.end(), dense.begin(), dense.end());
    EXPECT_GT(share_found(dense, with), std::max(0.89, share_found(dense, without)));
  }
  EXPECT_GT(share_found(all, with), 0.99);
}

/// The recordings, all but one, over and over and equally loud; of unit power.
std::vector<double> babble(const std::vector<Pcm> &recordings, std::size_t without,
                           std::size_t samples) {
  std::vector<double> babble(samples);
  for (std::size_t other = 0; other < recordings.size(); ++other) {
    if (other == without) continue;
    const Pcm &voice = recordings[other];
    const double level = std::pow(10, speech_level(voice, 16000) / 20);
    for (std::size_t i = 0; i < samples; ++i)
      babble[i] += voice[(i + 7000 * other) % voice.size()] / level;
  }
  double power = 0;
  for (const double value : babble) power += value * value;
  for (double &value : babble) value /= std::sqrt(power / double(samples));
  return babble;
}

/// How much of the speech lies in utterances, and how much of the utterances lies beside it.
struct Coverage {
  double speech = 0, kept = 0, beyond_s = 0;

  void take(const std::vector<bool> &is_speech, const std::vector<Span> &spans) {
    for (std::size_t i = 0; i < is_speech.size(); ++i) {
      const double middle_s = 0.01 * double(i) + 0.005;
      speech += is_speech[i];
      kept += is_speech[i] && std::ranges::any_of(spans, [=](const Span &s) {
                return s.start_s <= middle_s && middle_s < s.end_s;
              });
    }
    const auto first = std::ranges::find(is_speech, true) - is_speech.begin();
    const auto behind = std::find(is_speech.rbegin(), is_speech.rend(), true) - is_speech.rbegin();
    const Span words = {0.01 * double(first), 0.01 * double(std::ssize(is_speech) - behind)};
    for (const auto &[start_s, end_s] : spans)
      beyond_s += std::max(0.0, std::min(end_s, words.start_s) - start_s) +
                  std::max(0.0, end_s - std::max(start_s, words.end_s));
  }
  double percent() const { return 100 * kept / speech; }
};

TEST(Recordings, WordsAreKept) {
  const struct {
    const char *background;
    double below_db;
    double min_kept[5];  // in percent, of each way below
  } kMixes[] = {{"white", 60, {88, 96, 99, 96, 99}},  {"white", 20, {88, 96, 98, 95, 98}},
                {"white", 10, {85, 95, 97, 90, 97}},  {"white", 5, {80, 93, 95, 74, 92}},
                {"white", 0, {63, 80, 83, 36, 61}},   {"pink", 20, {88, 96, 98, 95, 98}},
                {"pink", 10, {87, 95, 97, 90, 97}},   {"pink", 5, {76, 89, 91, 73, 90}},
                {"pink", 0, {37, 59, 62, 33, 52}},    {"babble", 20, {88, 96, 99, 98, 99}},
                {"babble", 10, {89, 96, 99, 99, 99}}, {"babble", 5, {91, 97, 99, 99, 99}},
                {"babble", 0, {85, 91, 98, 99, 99}}};
  const UtteranceSettings ways[] = {settings_of(false, false), settings_of(false, true),
                                    settings_of(false, true, true), settings_of(true, false),
                                    settings_of(true, true)};
  const auto recordings = ten_recordings();
  std::puts("               channel energy               MCRA              beyond the words [ms]");
  std::puts("background       bare  padded  and lead-in    bare  padded     channel energy   MCRA");
  for (const auto &[background, below_db, min_kept] : kMixes) {
    const std::string kind = background;
    Coverage found[5];
    for (std::size_t r = 0; r < recordings.size(); ++r) {
      const Pcm &speech = recordings[r];
      Pcm mixed(speech.size() + 24000);
      const auto noise =
          kind == "babble"
              ? babble(recordings, r, mixed.size())
              : unit_noise(mixed.size(), kind == "white" ? NoiseColour::kWhite : NoiseColour::kPink,
                           20260705 + static_cast<unsigned>(r));
      const double level = std::pow(10, (speech_level(speech, 16000) - below_db) / 20);
      for (std::size_t i = 0; i < mixed.size(); ++i)
        mixed[i] = to_sample(level * noise[i] + (i < speech.size() ? speech[i] : 0));
      for (int way = 0; way < 5; ++way)
        found[way].take(speech_frames(speech), utterances_of(mixed, ways[way]));
    }
    std::printf("%-6s %2.0f dB   %5.1f   %5.1f        %5.1f   %5.1f   %5.1f     %14.0f  %5.0f\n",
                background, below_db, found[0].percent(), found[1].percent(), found[2].percent(),
                found[3].percent(), found[4].percent(), 100 * found[2].beyond_s,
                100 * found[4].beyond_s);
    for (int way = 0; way < 5; ++way) EXPECT_GT(found[way].percent(), min_kept[way]) << kind;
    EXPECT_GT(found[2].percent(), found[1].percent()) << kind;
    EXPECT_TRUE(kind == "babble" || found[2].beyond_s < 2.5) << kind;
  }
}

TEST(Recordings, SteadyNoiseHoldsNoUtterance) {
  UtteranceSettings settings = settings_of(false, false);
  for (const int32_t rate_hz : {16000, 8000}) {
    settings.rate_hz = rate_hz;
    for (const double dbfs : {-50.0, -30.0}) {
      const double level = 20 * std::log10(32768) + dbfs;
      const Pcm noise = in_noise({}, rate_hz * 30, NoiseColour::kWhite, level);
      EXPECT_TRUE(utterances_of(noise, settings).empty()) << rate_hz << " Hz, " << dbfs << " dBFS";
    }
  }
}

}  // namespace
