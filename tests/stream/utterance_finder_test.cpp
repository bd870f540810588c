// The utterance finder on scripted decisions, where every number of its rules is known.
#include "stream/utterance_finder.h"

#include <gtest/gtest.h>

#include <sstream>
#include <string>
#include <utility>
#include <vector>

#include "stream/frame_detector.h"

namespace orvalis::test {
namespace {

/// Settings in the order below, a script of runs like "50o 60s 2n" (frames of no speech, of speech,
/// of null audio), and the utterances in frames, as "start-end start-end!", where the mark means
/// open.
struct Case {
  const char *settings, *runs, *spans;

  FinderSettings finder_settings() const {
    UtteranceSettings s = UTTERANCE_SETTINGS_DEFAULT;
    std::istringstream(settings) >> s.rate_hz >> s.detector >> s.content_type >> s.hangover_ms >>
        s.pad_before_ms >> s.pad_after_ms >> s.min_speech_ms;
    return orvalis::finder_settings(s, decision_timing(s));
  }
};

/// A finder and what it found. What it reports on the way has to be consistent.
struct Finder {
  FinderSettings settings;
  UtteranceFinder finder{settings};
  UtteranceQueue queue = {};
  std::vector<Utterance> found = {};
  int64_t processed = 0, told = 0;

  void process(const char *runs) {
    std::istringstream in(runs);
    int count = 0;
    for (char kind = 0; in >> count >> kind;) {
      for (; count > 0; --count, processed += settings.timing.frame_samples) {
        finder.process(kind == 's', kind == 'n', queue);
        take_all();
      }
    }
  }

  /// Half a frame is left over.
  void finish() {
    finder.finish(processed + settings.timing.frame_samples / 2, queue);
    take_all();
  }

  void take_all() {
    for (Utterance next; queue.pop(next);) {
      EXPECT_GE(next.start, told) << "an utterance lies where audio may have been forgotten";
      told = next.start;  // as long as it waits
      EXPECT_EQ(next.number, std::ssize(found) + 1);
      found.push_back(next);
    }
    EXPECT_GE(finder.earliest_start(), told) << "never goes back";
    told = finder.earliest_start();
  }
};

TEST(UtteranceFinder, FollowsItsRules) {
  const Case kCases[] = {
      // Segments are dated back by the detector's delay,
      {"16000 0 0 500 0 0 0", "60o 90s 80o", "55-125"},
      {"16000 0 2 500 0 0 0", "60o 90s 80o", "57-136"},
      {"8000 0 0 500 0 0 0", "60o 90s 80o", "55-122"},
      {"8000 0 7 500 0 0 0", "60o 90s 80o", "57-133"},
      {"16000 1 0 500 0 0 0", "60o 90s 80o", "60-150"},
      // not beyond the input or their predecessor, and hold something beside the closing pause.
      {"16000 0 0 0 0 0 0", "2o 60s 2o", "0-37"},
      {"16000 0 0 0 0 0 0", "50o 40s 1n 1o 60s 2o", "45-90 90-127"},
      {"16000 0 0 0 0 0 0", "50o 20s 40o", ""},
      // An end that the detector has not seen is not dated back.
      {"16000 0 0 500 0 0 0", "50o 30s", "45-80!"},
      // They are joined within the hangover.
      {"16000 0 0 500 0 0 0", "50o 60s 49o 60s 80o", "45-194"},
      {"16000 0 0 500 0 0 0", "50o 60s 50o 60s 80o", "45-85 155-195"},
      {"16000 0 0 509 0 0 0", "50o 60s 50o 60s 80o", "45-85 155-195"},
      {"16000 0 0 0 0 0 0", "50o 60s 1o 60s 80o", "45-85 106-146"},
      {"16000 0 0 20 0 0 0", "50o 60s 1o 60s 80o", "45-146"},
      {"16000 1 0 0 0 0 0", "5o 3s 1n 3s 9o", "5-8 9-12"},
      // Null audio for good: the end is the last decision for speech.
      {"16000 0 0 100 0 0 0", "50o 60s 100n", "45-110"},
      // Resumed without a new onset: not dated back, whether joined or not;
      {"16000 0 0 100 0 0 0", "50o 60s 9n 40s 60o", "45-134"},
      {"16000 0 0 100 0 0 0", "50o 60s 10n 40s 60o", "45-110 120-135"},
      // with a decision for no speech in between, a new onset;
      {"16000 0 0 100 0 0 0", "50o 60s 2n 1o 21n 40s 60o", "45-110 129-149"},
      // into nothing but the closing pause: the joined end stays.
      {"16000 0 0 100 0 0 0", "50o 60s 2n 10s 60o", "45-110"},
      // What the detector refuses is dropped,
      {"16000 0 2 500 0 0 0", "50o 19s 80o", ""},
      {"16000 0 2 500 0 0 0", "50o 20s 80o", "47-56"},
      {"16000 0 1 500 0 0 0", "50o 44s 80o", "45-69"},
      // neither lengthens its predecessor nor restarts the hangover nor keeps padding off,
      {"16000 0 2 500 0 0 0", "50o 60s 20o 19s 80o", "47-96"},
      {"16000 0 2 500 0 0 0", "50o 60s 20o 19s 11o 30s 2o", "47-96 157-176"},
      {"16000 0 2 500 0 0 0", "50o 60s 20o 19s 10o 30s 2o", "47-175"},
      {"16000 0 2 0 0 1000 0", "50o 60s 20o 19s 80o", "47-196"},
      // and null audio does not split its run.
      {"16000 0 2 500 0 0 0", "50o 10s 2n 20s 80o", "47-68"},
      {"16000 0 2 500 0 0 0", "50o 10s 2n 9s 80o", ""},
      {"16000 0 2 500 0 0 0", "50o 60s 1o 10s 2n 81o", "47-96"},
      {"16000 0 2 500 0 0 0", "50o 10s 2n 15s 80o", "47-63"},
      {"16000 0 2 100 0 0 0", "50o 60s 2o 10s 20n 5s 80o", "47-96"},
      // Padding goes up to the middle of a gap, and to the end of the input.
      {"16000 0 0 0 100 200 0", "50o 60s 50o 60s 100o", "35-105 145-215"},
      {"16000 0 0 0 350 350 0", "50o 60s 50o 60s 100o", "10-120 120-230"},
      {"16000 0 0 0 1000 1000 0", "50o 60s 51o 60s 100o", "0-120.5 120.5-296"},
      {"16000 0 0 0 1000 50 0", "50o 60s 50o 60s 100o", "0-90 120-200"},
      {"16000 0 0 0 0 100000 0", "50o 60s 50o 60s 100o", "45-120 155-320.5"},
      // A neighbour that turns out to be closing pause alone keeps it off all the same.
      {"8000 0 1 5 25 15 0", "1s 2n 1s 1o 1s", "0-2 2-6.5!"},
      // What holds too little speech, dated back and joined, is dropped and keeps no padding off.
      {"16000 0 0 100 0 0 200", "50o 39s 60o", ""},
      {"16000 0 0 100 0 0 200", "50o 40s 60o", "45-65"},
      {"16000 0 0 100 0 0 200", "50o 30s 9o 30s 60o", "45-94"},
      {"16000 0 0 100 0 0 200", "50o 14s 60n", ""},
      {"16000 0 0 100 0 0 200", "50o 15s", "45-65!"},
      {"16000 0 0 100 0 0 200", "50o 14s 20n 3s", ""},
      {"16000 1 0 0 50 300 40", "9o 4s 9o 3s 9o 4s 9o", "4-23.5 29-47.5"}};
  for (const Case &given : kCases) {
    Finder finder{given.finder_settings()};
    finder.process(given.runs);
    finder.finish();
    std::ostringstream spans;
    for (const Utterance &u : finder.found) {
      const double frame = finder.settings.timing.frame_samples;
      spans << (u.number > 1 ? " " : "") << static_cast<double>(u.start) / frame << '-'
            << static_cast<double>(u.end) / frame << (u.open == 1 ? "!" : "");
    }
    EXPECT_EQ(spans.str(), given.spans) << given.settings << ": " << given.runs;
  }
}

/// An utterance as soon as it is decided, and before it what audio may be forgotten.
TEST(UtteranceFinder, TellsInTime) {
  using Fields = std::pair<int64_t, int64_t>;
  struct Step {
    const char *runs;
    int64_t found, earliest;  // the latter in frames
  };
  const auto expect = [](const Case &given, const std::vector<Step> &steps) {
    Finder finder{given.finder_settings()};
    for (const auto &[runs, found, earliest] : steps) {
      finder.process(runs);
      EXPECT_EQ(std::ssize(finder.found), found) << runs;
      EXPECT_EQ(finder.told, earliest * 160) << runs;
    }
    return Fields(finder.found[0].began / 160, finder.found[0].ended / 160);
  };
  // In silence it follows, less the delay and the padding; in speech it waits at the start.
  EXPECT_EQ(
      expect({"16000 0 0 0 100 100 0", "", ""},
             {{"40o", 0, 25}, {"10o 51s", 0, 35}, {"9s 41o", 1, 136}, {"9o 60s 40o 60s", 2, 245}}),
      Fields(51, 110));
  // Speech could come within twice the padding; what comes is too short to be a neighbour as yet.
  EXPECT_EQ(expect({"16000 1 0 30 0 40 20", "", ""},
                   {{"5s 7o", 0, 0}, {"1o", 1, 13}, {"3s 4o 1s", 1, 13}, {"1s", 2, 20}}),
            Fields(1, 5));
}

}  // namespace
}  // namespace orvalis::test
