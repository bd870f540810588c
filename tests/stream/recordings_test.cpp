// Where the utterances of real recordings lie, clean and in noise: against the recordings' own
// energy and the number of words that their transcripts hold.
#include <gtest/gtest.h>

#include <algorithm>
#include <cstdio>
#include <fstream>
#include <iterator>
#include <map>
#include <string>
#include <utility>

#include "jni/orvalis.h"
#include "stream/utterance_stream.h"
#include "tests/support/noise.h"
#include "tests/support/recordings.h"

namespace {

using namespace orvalis::test;

struct Span {
  double start_s;
  double end_s;
};

std::vector<Span> utterances_of(const Pcm &pcm, int32_t rate_hz) {
  UtteranceSettings settings = UTTERANCE_SETTINGS_DEFAULT;
  settings.rate_hz = rate_hz;
  settings.pad_before_ms = settings.pad_after_ms = 0;  // what the detector itself finds
  UtteranceStream *stream = OpenUtteranceStream(&settings);
  EXPECT_EQ(PushUtteranceAudio(stream, pcm.data(), static_cast<int32_t>(pcm.size())),
            static_cast<int32_t>(pcm.size()));
  FlushUtteranceStream(stream);
  std::vector<Span> spans;
  for (Utterance next; NextUtterance(stream, &next) == 1;) {
    spans.push_back({double(next.start) / rate_hz, double(next.end) / rate_hz});
  }
  CloseUtteranceStream(stream);
  return spans;
}

/// The range of a recording's frames whose level reaches its loudest frame's less `below_db`.
Span active_range(const Pcm &pcm, int32_t rate_hz, double below_db) {
  const auto levels = frame_levels(pcm, static_cast<std::size_t>(rate_hz / 100));
  const double threshold = *std::max_element(levels.begin(), levels.end()) - below_db;
  const auto is_active = [&](double level) { return level >= threshold; };
  const auto first = std::find_if(levels.begin(), levels.end(), is_active);
  const auto last = std::find_if(levels.rbegin(), levels.rend(), is_active);
  return {0.01 * double(first - levels.begin()), 0.01 * double(levels.rend() - last)};
}

/// The range that holds all of a recording's energy but `rest` of it on either side.
Span energetic_range(const Pcm &pcm, int32_t rate_hz, double rest) {
  std::vector<double> energy;
  double sum = 0;
  for (const std::int16_t sample : pcm) energy.push_back(sum += double(sample) * sample);
  const auto time_of = [&](double share) {
    const auto at = std::lower_bound(energy.begin(), energy.end(), share * sum);
    return double(at - energy.begin()) / rate_hz;
  };
  return {time_of(rest), time_of(1 - rest)};
}

/// Words of each recording by its name, from lines like "<s> ten of clubs </s> (001)".
std::map<std::string, int> words_of(const std::string &transcript) {
  std::ifstream file(std::string(ORVALIS_SPEECH_16K) + "/" + transcript);
  std::map<std::string, int> words;
  int count = 0;
  for (std::string word; file >> word;) {
    if (word.front() == '(') words[word.substr(1, word.size() - 2)] = std::exchange(count, 0);
    if (word.front() != '<' && word.front() != '(') ++count;
  }
  return words;
}

struct Condition {
  const char *name;
  NoiseColour colour;
  double below_db;
  double start_slack_s;  // how much of the loud part may be missing
  double end_slack_s;
};

// Clean means noise so low that it only keeps the pauses from being null audio.
const Condition kConditions[] = {{"clean", NoiseColour::kWhite, 60, 0.05, 0.05},
                                 {"white at 20 dB", NoiseColour::kWhite, 20, 0.05, 0.05},
                                 {"pink at 20 dB", NoiseColour::kPink, 20, 0.05, 0.05},
                                 {"white at 10 dB", NoiseColour::kWhite, 10, 0.10, 0.20},
                                 {"pink at 10 dB", NoiseColour::kPink, 10, 0.10, 0.20}};

/// The one utterance of a recording in noise, in the recording's own time; 0 to 0 if there are
/// more.
Span utterance_in_noise(const Pcm &speech, int32_t rate_hz, NoiseColour colour, double below_db) {
  const auto margin = static_cast<std::size_t>(rate_hz * 3 / 2);
  const double level = speech_level(speech, rate_hz) - below_db;
  const auto found = utterances_of(in_noise(speech, margin, colour, level), rate_hz);
  EXPECT_EQ(found.size(), 1u);
  return found.size() == 1 ? Span{found[0].start_s - 1.5, found[0].end_s - 1.5} : Span{};
}

/// How far the utterances of a condition reach beyond the loud part of their recordings.
struct Margins {
  int recordings = 0;
  std::vector<double> before_ms, after_ms;
};

void print(const char *condition, Margins &margins) {
  std::printf("%-15s %2zu of %2d", condition, margins.before_ms.size(), margins.recordings);
  for (auto *ms : {&margins.before_ms, &margins.after_ms}) {
    std::ranges::sort(*ms);
    if (ms->empty()) continue;
    std::printf("  %6.0f %6.0f %6.0f", ms->front(), (*ms)[ms->size() / 2], ms->back());
  }
  std::printf("\n");
}

TEST(Recordings, EachSentenceIsOneUtteranceWhereItsWordsAre) {
  auto words = words_of("librivox/transcription");
  words.merge(words_of("cards/cards.transcription"));
  ASSERT_EQ(words.size(), 10u);
  Margins margins[std::size(kConditions)];
  for (const auto &[name, count] : words) {
    const Pcm speech = speech_16k((name.size() == 3 ? "cards/" : "librivox/") + name + ".wav");
    const Span loud = energetic_range(speech, 16000, 0.005);
    const Span audible = active_range(speech, 16000, 40);
    for (std::size_t i = 0; i < std::size(kConditions); ++i) {
      const auto &[condition, colour, below_db, start_slack_s, end_slack_s] = kConditions[i];
      SCOPED_TRACE(name + ", " + condition);
      const Span span = utterance_in_noise(speech, 16000, colour, below_db);
      EXPECT_LT(span.start_s, loud.start_s + start_slack_s);
      EXPECT_GT(span.end_s, loud.end_s - end_slack_s);
      EXPECT_GT(span.start_s, audible.start_s - 0.05);
      EXPECT_LT(span.end_s, audible.end_s + 0.05);
      EXPECT_GT((span.end_s - span.start_s) / count, 0.18) << "seconds a word";
      EXPECT_LT((span.end_s - span.start_s) / count, 0.60) << "seconds a word";
      ++margins[i].recordings;
      if (span.end_s == span.start_s) continue;
      margins[i].before_ms.push_back(1000 * (loud.start_s - span.start_s));
      margins[i].after_ms.push_back(1000 * (span.end_s - loud.end_s));
    }
  }
  std::printf(
      "noise              found   before the words [ms]    after the words [ms]\n"
      "                           least median   most    least median   most\n");
  for (std::size_t i = 0; i < std::size(kConditions); ++i) print(kConditions[i].name, margins[i]);
}

TEST(Recordings, CommandsAndNumbersAreFoundAtBothRates) {
  const std::pair<const char *, int32_t> kRecordings[] = {{"goforward.raw", 16000},
                                                          {"something.raw", 16000},
                                                          {"tidigits/dhd.2934z.raw", 16000},
                                                          {"wav/hts1a.wav", 8000},
                                                          {"wav/big_dog.wav", 8000}};
  for (const auto &[name, rate_hz] : kRecordings) {
    const Pcm speech = rate_hz == 16000 ? speech_16k(name) : speech_8k(name);
    const Span loud = energetic_range(speech, rate_hz, 0.005);
    for (const double below_db : {60.0, 20.0}) {
      SCOPED_TRACE(testing::Message() << name << " at " << below_db << " dB");
      const Span span = utterance_in_noise(speech, rate_hz, NoiseColour::kPink, below_db);
      EXPECT_LT(span.start_s, loud.start_s + 0.1);
      EXPECT_GT(span.end_s, loud.end_s - 0.1);
    }
  }
}

TEST(Recordings, SteadyNoiseHoldsNoUtterance) {
  for (const int32_t rate_hz : {16000, 8000}) {
    for (const double dbfs : {-50.0, -30.0}) {
      const double level = 20 * std::log10(32768) + dbfs;
      const Pcm noise =
          in_noise({}, static_cast<std::size_t>(rate_hz) * 30, NoiseColour::kWhite, level);
      EXPECT_TRUE(utterances_of(noise, rate_hz).empty()) << rate_hz << " Hz, " << dbfs << " dBFS";
    }
  }
}

}  // namespace
