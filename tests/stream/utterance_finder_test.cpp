// The utterance finder on scripted decisions, where every number of its rules is known.
#include "stream/utterance_finder.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <sstream>
#include <string>
#include <utility>
#include <vector>

#include "stream/frame_detector.h"
#include "tests/support/random.h"

namespace orvalis::test {
namespace {

UtteranceSettings settings_of(int32_t rate, int32_t content_type, int32_t hangover_ms,
                              int32_t pad_before_ms = 0, int32_t pad_after_ms = 0) {
  UtteranceSettings settings = UTTERANCE_SETTINGS_DEFAULT;
  settings.rate_hz = rate;
  settings.content_type = content_type;
  settings.hangover_ms = hangover_ms;
  settings.pad_before_ms = pad_before_ms;
  settings.pad_after_ms = pad_after_ms;
  return settings;
}

/// The script of runs like "50o 60s 2n", one character a frame: no speech, speech, null audio.
std::string frames(const std::string &runs) {
  std::string script;
  std::istringstream in(runs);
  int count = 0;
  for (char kind = 0; in >> count >> kind;) script.append(static_cast<std::size_t>(count), kind);
  return script;
}

/// A finder and its queue, which is always emptied. Checks that what it reports is consistent.
class Finder {
public:
  explicit Finder(const FinderSettings &settings) : finder_(settings) {}

  void process(char kind) {
    finder_.process(kind == 's', kind == 'n', queue_);
    take_all();
  }

  void process(const std::string &script) {
    for (const char kind : script) process(kind);
  }

  std::vector<Utterance> finish(int64_t input_end) {
    finder_.finish(input_end, queue_);
    take_all();
    return found;
  }

  int64_t earliest() const { return finder_.earliest_start(); }

  std::vector<Utterance> found;

private:
  void take_all() {
    for (Utterance next; queue_.pop(next);) {
      EXPECT_GE(next.start, told_) << "an utterance lies where audio may have been forgotten";
      EXPECT_EQ(next.number, std::ssize(found) + 1);
      EXPECT_GE(next.start, found.empty() ? 0 : found.back().end);
      found.push_back(next);
    }
    EXPECT_GE(earliest(), told_) << "never goes back";
    told_ = earliest();
  }

  UtteranceFinder finder_;
  UtteranceQueue queue_;
  int64_t told_ = 0;
};

/// What is found in a script with `rest` samples behind it.
std::vector<Utterance> utterances_of(const FinderSettings &settings, const std::string &script,
                                     int64_t rest = 0) {
  Finder finder(settings);
  finder.process(script);
  return finder.finish(std::ssize(script) * settings.timing.frame_samples + rest);
}

std::vector<Utterance> utterances_of(const UtteranceSettings &settings, const std::string &runs,
                                     int64_t rest = 0) {
  return utterances_of(finder_settings(settings, decision_timing(settings)), frames(runs), rest);
}

/// Settings and a script, and the utterances in frames, as "start-end start-end".
struct Case {
  UtteranceSettings settings;
  std::string runs;
  std::string spans;
};

void expect_spans(const std::vector<Case> &cases) {
  for (const auto &[settings, runs, expected] : cases) {
    const int32_t frame = settings.rate_hz / 100;
    std::string spans;
    for (const Utterance &next : utterances_of(settings, runs)) {
      EXPECT_EQ(next.start % frame, 0);
      EXPECT_EQ(next.end % frame, 0);
      if (!spans.empty()) spans += ' ';
      spans += std::to_string(next.start / frame) + "-" + std::to_string(next.end / frame);
    }
    EXPECT_EQ(spans, expected) << runs;
  }
}

TEST(UtteranceFinder, DatesPiecesBackByTheDetectorsDelay) {
  constexpr int32_t kCases[][4] = {{16000, 0, 5, 25},  {16000, 1, 5, 25}, {16000, 2, 3, 14},
                                   {16000, -1, 3, 14}, {8000, 0, 5, 28},  {8000, 7, 3, 17}};
  for (const auto &[rate, content_type, start_frames, end_frames] : kCases) {
    const int32_t frame = rate / 100;
    const auto found = utterances_of(settings_of(rate, content_type, 500), "60o 90s 80o");
    ASSERT_EQ(found.size(), 1u);
    EXPECT_EQ(found[0].start, (60 - start_frames) * frame);
    EXPECT_EQ(found[0].end, (150 - end_frames) * frame);
    EXPECT_EQ(found[0].began, 61 * frame);
    EXPECT_EQ(found[0].ended, 150 * frame);
    EXPECT_EQ(found[0].open, 0);
  }
}

TEST(UtteranceFinder, ClipsToTheInputAndToThePreviousPiece) {
  const auto no_hangover = settings_of(16000, 0, 0);
  expect_spans({{no_hangover, "2o 60s 2o", "0-37"},
                // The interrupted segment ends undated; the next onset is dated back into it.
                {no_hangover, "50o 40s 1n 1o 60s 2o", "45-90 90-127"},
                // A segment no longer than the closing pause holds no speech.
                {no_hangover, "50o 20s 40o", ""}});
}

TEST(UtteranceFinder, JoinsWithinTheHangover) {
  expect_spans({{settings_of(16000, 0, 500), "50o 60s 49o 60s 80o", "45-194"},
                {settings_of(16000, 0, 500), "50o 60s 50o 60s 80o", "45-85 155-195"},
                {settings_of(16000, 0, 509), "50o 60s 50o 60s 80o", "45-85 155-195"},
                {settings_of(16000, 0, 0), "50o 60s 1o 60s 80o", "45-85 106-146"},
                {settings_of(8000, 0, 500), "50o 60s 49o 60s 80o", "45-191"},
                {settings_of(16000, 0, 20), "50o 60s 1o 60s 80o", "45-146"}});
}

TEST(UtteranceFinder, TreatsNullAudioAsSilence) {
  const auto settings = settings_of(16000, 0, 100);
  // Interrupted for good: the end is the last decision for speech.
  expect_spans({{settings, "50o 60s 100n", "45-110"},
                // Resumed without a new onset: not dated back, whether joined or not.
                {settings, "50o 60s 9n 40s 60o", "45-134"},
                {settings, "50o 60s 10n 40s 60o", "45-110 120-135"},
                // A decision for no speech in between, so the next run is a new onset.
                {settings, "50o 60s 2n 1o 21n 40s 60o", "45-110 129-149"},
                // Resumed into nothing but the closing pause: the joined end stays.
                {settings, "50o 60s 2n 10s 60o", "45-110"}});
}

TEST(UtteranceFinder, DropsWhatTheDetectorRefused) {
  const auto settings = settings_of(16000, 2, 500);
  expect_spans({{settings, "50o 19s 80o", ""},
                {settings, "50o 20s 80o", "47-56"},
                {settings_of(16000, 1, 500), "50o 44s 80o", "45-69"},
                // A refused run neither lengthens its predecessor nor restarts the hangover.
                {settings, "50o 60s 20o 19s 80o", "47-96"},
                {settings, "50o 60s 20o 19s 11o 30s 2o", "47-96 157-176"},
                {settings, "50o 60s 20o 19s 10o 30s 2o", "47-175"},
                // Null audio does not split the detector's count of decisions.
                {settings, "50o 10s 2n 20s 80o", "47-68"},
                {settings, "50o 10s 2n 9s 80o", ""},
                {settings, "50o 60s 1o 10s 2n 81o", "47-96"},
                {settings, "50o 10s 2n 15s 80o", "47-63"},
                // Refused after the hangover is over: the predecessor is handed out once.
                {settings_of(16000, 2, 100), "50o 60s 2o 10s 20n 5s 80o", "47-96"},
                // A refused run is no neighbour whose padding would meet.
                {settings_of(16000, 2, 0, 0, 1000), "50o 60s 20o 19s 80o", "47-196"}});
}

TEST(UtteranceFinder, PadsUpToTheMiddleOfAGap) {
  // Speech from frame 45 to 85 and from 155 to 195: a gap of 70 frames.
  const std::string runs = "50o 60s 50o 60s 100o";
  expect_spans({{settings_of(16000, 0, 0, 100, 200), runs, "35-105 145-215"},
                {settings_of(16000, 0, 0, 350, 350), runs, "10-120 120-230"},
                {settings_of(16000, 0, 0, 1000, 1000), runs, "0-120 120-295"},
                {settings_of(16000, 0, 0, 1000, 50), runs, "0-90 120-200"},
                {settings_of(16000, 0, 0, 0, 100000), runs, "45-120 155-320"},
                {settings_of(16000, 0, 0, 0, 500), runs, "45-120 155-245"}});

  // The halves of an odd gap neither overlap nor leave a sample out.
  const auto found = utterances_of(settings_of(8000, 0, 0, 5000, 5000), runs, 33);
  ASSERT_EQ(found.size(), 2u);
  EXPECT_EQ(found[0].end, found[1].start);
  EXPECT_EQ(found[1].end, 320 * 80 + 33) << "padding may use the samples that were not judged";
}

TEST(UtteranceFinder, PaddingKeepsOffAPieceThatHeldNoSpeech) {
  // The neighbour that limits the first one's padding turns out to be closing pause alone.
  EXPECT_EQ(utterances_of(settings_of(8000, 1, 5, 25, 15), "1s 2n 1s 1o 1s").size(), 2u);
}

TEST(UtteranceFinder, TellsWhatAudioMayBeForgotten) {
  // 45-85 and 155-195 are handed out once there is room for their padding; 255 is still open.
  const int32_t frame = 160, pad_frames = 10;
  const auto settings = settings_of(16000, 0, 0, pad_frames * 10, pad_frames * 10);
  Finder finder(finder_settings(settings, decision_timing(settings)));
  std::vector<int64_t> earliest_starts;
  for (const char kind : frames("50o 60s 50o 60s 40o 60s")) {
    finder.process(kind);
    earliest_starts.push_back(finder.earliest());
  }
  const auto found = finder.finish(std::ssize(earliest_starts) * frame);
  ASSERT_EQ(found.size(), 3u);
  // In silence it follows, less the delay and the padding; in speech it waits at the start.
  EXPECT_EQ(earliest_starts[39], (40 - 5 - pad_frames) * frame);
  EXPECT_EQ(earliest_starts[100], found[0].start);
  EXPECT_EQ(earliest_starts[150], (151 - 5 - pad_frames) * frame);
  EXPECT_EQ(earliest_starts.back(), found[2].start);
}

TEST(UtteranceFinder, AnEndThatTheDetectorHasNotSeenIsNotDatedBack) {
  for (const int32_t content_type : {0, 2}) {
    const auto found = utterances_of(settings_of(16000, content_type, 500), "50o 30s", 159);
    ASSERT_EQ(found.size(), 1u);
    EXPECT_EQ(found[0].open, 1);
    EXPECT_EQ(found[0].end, 80 * 160);
  }
}

/// Of a detector without delays, border by border, from all its decisions at once.
std::vector<Utterance> expected_of(const FinderSettings &settings, const std::string &script,
                                   int64_t input_end) {
  const int64_t frame = settings.timing.frame_samples;
  std::vector<Utterance> bare;
  for (int64_t i = 0; i < std::ssize(script); ++i) {
    if (script[static_cast<std::size_t>(i)] != 's') continue;
    const int64_t start = i * frame, end = start + frame;
    if (bare.empty() || (end - bare.back().end > settings.hangover && start > bare.back().end))
      bare.push_back({.start = start, .end = 0, .began = end, .ended = 0, .number = 0, .open = 0});
    bare.back().end = bare.back().ended = end;
  }
  if (script.back() == 's') bare.back().open = 1;
  std::erase_if(bare, [&](const Utterance &u) { return u.end - u.start < settings.min_speech; });
  std::vector<Utterance> found = bare;
  for (std::size_t i = 0; i < found.size(); ++i) {
    const auto half_gap = [&](std::size_t next) {
      return (bare[next].start - bare[next - 1].end) / 2;
    };
    const int64_t first = i == 0 ? 0 : bare[i - 1].end + half_gap(i);
    const int64_t last = i + 1 == found.size() ? input_end : bare[i].end + half_gap(i + 1);
    found[i].start = std::max(bare[i].start - settings.pad_before, first);
    found[i].end = std::min(bare[i].end + settings.pad_after, last);
    found[i].number = static_cast<int32_t>(i) + 1;
  }
  return found;
}

bool are_same(const Utterance &a, const Utterance &b) {
  return a.start == b.start && a.end == b.end && a.began == b.began && a.ended == b.ended &&
         a.number == b.number && a.open == b.open;
}

constexpr DecisionTiming kUndelayed = {
    .frame_samples = 10, .start_delay = 0, .end_delay = 0, .refused_run = 0};

TEST(UtteranceFinder, JoinsLeavesOutAndPadsWhatAnUndelayedDetectorDecides) {
  auto generator = seeded_generator();
  const auto up_to = [&](int64_t most) {
    return std::uniform_int_distribution<int64_t>(0, most)(generator);
  };
  for (int round = 0; round < 3000; ++round) {
    const FinderSettings settings{kUndelayed, up_to(80), up_to(70), up_to(70), up_to(60)};
    std::string script;
    while (script.size() < 100)
      script.append(static_cast<std::size_t>(1 + up_to(round % 30)), up_to(1) == 1 ? 's' : 'o');
    const int64_t rest = 7, input_end = 10 * std::ssize(script) + rest;
    ASSERT_TRUE(std::ranges::equal(utterances_of(settings, script, rest),
                                   expected_of(settings, script, input_end), are_same))
        << "round " << round << ": " << script;
  }
}

TEST(UtteranceFinder, LeavesOutWhatHoldsTooLittleSpeech) {
  auto settings = settings_of(16000, 0, 100);
  const FinderSettings least = [&] {
    auto some = finder_settings(settings, decision_timing(settings));
    some.min_speech = 20 * 160;
    return some;
  }();
  const auto spans = [&](const std::string &runs) {
    std::string text;
    for (const Utterance &u : utterances_of(least, frames(runs)))
      text += std::to_string(u.start / 160) + "-" + std::to_string(u.end / 160) + " ";
    return text;
  };
  EXPECT_EQ(spans("50o 39s 60o"), "") << "19 frames, dated back at both ends";
  EXPECT_EQ(spans("50o 40s 60o"), "45-65 ");
  EXPECT_EQ(spans("50o 30s 9o 30s 60o"), "45-94 ") << "what is joined counts together";
  EXPECT_EQ(spans("50o 14s 60n"), "") << "and what was interrupted as far as it came";
  EXPECT_EQ(spans("50o 15s 60n"), "45-65 ");
  EXPECT_EQ(spans("50o 15s"), "45-65 ");
  EXPECT_EQ(spans("50o 14s 20n 3s"), "")
      << "nor does what is dropped at the end move the start back";
}

TEST(UtteranceFinder, HandsOutAsSoonAsItIsDecided) {
  Finder finder({kUndelayed, 30, 0, 40, 20});
  const auto found_after = [&](const std::string &runs) {
    finder.process(frames(runs));
    return finder.found.size();
  };
  EXPECT_EQ(found_after("5s 7o"), 0u) << "speech could still come within twice the padding";
  EXPECT_EQ(found_after("1o"), 1u);
  EXPECT_EQ(found_after("3s 4o 1s"), 1u) << "too short to be a neighbour as yet";
  EXPECT_EQ(found_after("1s"), 2u);
}

}  // namespace
}  // namespace orvalis::test
