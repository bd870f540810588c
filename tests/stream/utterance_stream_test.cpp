// The utterance stream on scripted answers, where every number of its rules is known, and on real
// recordings cut at random. Linked with --wrap for the frame call and malloc.
#include "stream/utterance_stream.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <cmath>
#include <memory>
#include <random>
#include <sstream>
#include <string>
#include <vector>

#include "jni/orvalis.h"
#include "tests/support/random.h"
#include "tests/support/recordings.h"
#include "tests/support/scripted_malloc.h"

namespace {

using orvalis::test::Pcm;

// One character a frame: '1' speech, '0' none, 'n' null audio.
std::string script;
std::size_t script_at = 0;
int32_t script_frame = 160;

/// Starts a script, or with "" gives the stream back to the real detector.
void play(const std::string &answers, int32_t frame_samples = 160) {
  script = answers;
  script_at = 0;
  script_frame = frame_samples;
}

class QuietLog : public testing::Environment {
  void SetUp() override {
    SetLogSink([](int, const char *, const char *, void *) {}, nullptr);
  }
};
const auto *const quiet_log = testing::AddGlobalTestEnvironment(new QuietLog);

}  // namespace

extern "C" int32_t __real_ProcessEPDFrameByCnttype(EpdInstance *, const int16_t *, int32_t,
                                                   int32_t);

extern "C" int32_t __wrap_ProcessEPDFrameByCnttype(EpdInstance *epd, const int16_t *pcm,
                                                   int32_t samples, int32_t content_type) {
  if (script.empty()) return __real_ProcessEPDFrameByCnttype(epd, pcm, samples, content_type);
  EXPECT_EQ(samples, script_frame) << "calls must be of exactly one frame";
  return script.at(script_at++) == '1' ? 1 : 0;
}

namespace {

struct StreamCloser {
  void operator()(UtteranceStream *stream) const { EXPECT_EQ(CloseUtteranceStream(stream), 0); }
};
using Stream = std::unique_ptr<UtteranceStream, StreamCloser>;

Stream open(const UtteranceSettings &settings) { return Stream(OpenUtteranceStream(&settings)); }

UtteranceSettings settings_of(int32_t rate, int32_t content_type, int32_t hangover_ms,
                              int32_t pad_before_ms = 0, int32_t pad_after_ms = 0) {
  return {rate, 0, content_type, hangover_ms, pad_before_ms, pad_after_ms, 0};
}

/// The script of runs like "50o 60s 2n": frames without speech, with speech, of null audio.
std::string frames(const std::string &runs) {
  std::string answers;
  std::istringstream in(runs);
  int count = 0;
  for (char kind = 0; in >> count >> kind;)
    answers.append(static_cast<std::size_t>(count), kind == 's' ? '1' : kind == 'o' ? '0' : 'n');
  return answers;
}

/// Takes what was decided to the end of a list.
void take_all(const Stream &stream, std::vector<Utterance> &found) {
  int64_t earliest = EarliestUtteranceStart(stream.get());
  for (Utterance next; NextUtterance(stream.get(), &next) == 1;) {
    EXPECT_GE(next.start, earliest);
    EXPECT_GE(EarliestUtteranceStart(stream.get()), earliest) << "never goes back";
    earliest = EarliestUtteranceStart(stream.get());
    found.push_back(next);
  }
}

/// Pushes what is left of the audio, as far as it is taken.
void push_rest(const Stream &stream, const Pcm &pcm, std::size_t &done,
               std::size_t piece = INT32_MAX) {
  const std::size_t length = std::min(piece, pcm.size() - done);
  const auto taken = PushUtteranceAudio(stream.get(), &pcm[done], static_cast<int32_t>(length));
  EXPECT_GE(taken, 0);
  done += static_cast<std::size_t>(taken);
}

/// Audio for a script: noise, or zeros where a frame is null.
Pcm audio_for(const std::string &answers, int32_t frame_samples) {
  Pcm pcm;
  for (const char answer : answers) {
    pcm.insert(pcm.end(), static_cast<std::size_t>(frame_samples), answer == 'n' ? 0 : 100);
  }
  return pcm;
}

/// The utterances that a stream finds when the detector answers as scripted. `rest` samples follow.
std::vector<Utterance> utterances_of(const UtteranceSettings &settings, const std::string &answers,
                                     int rest = 0) {
  play(answers, settings.rate_hz / 100);
  Pcm pcm = audio_for(answers, settings.rate_hz / 100);
  pcm.resize(pcm.size() + static_cast<std::size_t>(rest), 100);
  const Stream stream = open(settings);
  std::vector<Utterance> found;
  for (std::size_t done = 0; done < pcm.size(); take_all(stream, found))
    push_rest(stream, pcm, done);
  EXPECT_EQ(FlushUtteranceStream(stream.get()), rest);
  take_all(stream, found);
  play("");
  for (std::size_t i = 0; i < found.size(); ++i)
    EXPECT_EQ(found[i].number, static_cast<int>(i) + 1);
  return found;
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
    for (const Utterance &next : utterances_of(settings, frames(runs))) {
      EXPECT_EQ(next.start % frame, 0);
      EXPECT_EQ(next.end % frame, 0);
      if (!spans.empty()) spans += ' ';
      spans += std::to_string(next.start / frame) + "-" + std::to_string(next.end / frame);
    }
    EXPECT_EQ(spans, expected) << runs;
  }
}

TEST(UtteranceStream, DatesPiecesBackByTheDetectorsDelay) {
  constexpr int32_t kCases[][4] = {{16000, 0, 5, 25},  {16000, 1, 5, 25}, {16000, 2, 3, 14},
                                   {16000, -1, 3, 14}, {8000, 0, 5, 28},  {8000, 7, 3, 17}};
  for (const auto &[rate, content_type, start_frames, end_frames] : kCases) {
    const int32_t frame = rate / 100;
    const auto found = utterances_of(settings_of(rate, content_type, 500), frames("60o 90s 80o"));
    ASSERT_EQ(found.size(), 1u);
    EXPECT_EQ(found[0].start, (60 - start_frames) * frame);
    EXPECT_EQ(found[0].end, (150 - end_frames) * frame);
    EXPECT_EQ(found[0].began, 61 * frame);
    EXPECT_EQ(found[0].ended, 150 * frame);
    EXPECT_EQ(found[0].open, 0);
  }
}

TEST(UtteranceStream, ClipsToTheInputAndToThePreviousPiece) {
  const auto no_hangover = settings_of(16000, 0, 0);
  expect_spans({{no_hangover, "2o 60s 2o", "0-37"},
                // The interrupted piece ends undated; the next onset is dated back into it.
                {no_hangover, "50o 40s 1n 1o 60s 2o", "45-90 90-127"},
                // A piece that is no longer than the closing pause holds no speech.
                {no_hangover, "50o 20s 40o", ""}});
}

TEST(UtteranceStream, JoinsWithinTheHangover) {
  expect_spans({{settings_of(16000, 0, 500), "50o 60s 49o 60s 80o", "45-194"},
                {settings_of(16000, 0, 500), "50o 60s 50o 60s 80o", "45-85 155-195"},
                {settings_of(16000, 0, 509), "50o 60s 50o 60s 80o", "45-85 155-195"},
                {settings_of(16000, 0, 0), "50o 60s 1o 60s 80o", "45-85 106-146"},
                {settings_of(8000, 0, 500), "50o 60s 49o 60s 80o", "45-191"},
                {settings_of(16000, 0, 20), "50o 60s 1o 60s 80o", "45-146"}});
}

TEST(UtteranceStream, TreatsNullAudioAsSilence) {
  const auto settings = settings_of(16000, 0, 100);
  // Interrupted for good: the end is the last answer 1.
  expect_spans({{settings, "50o 60s 100n", "45-110"},
                // Resumed without a new onset: not dated back, whether joined or not.
                {settings, "50o 60s 9n 40s 60o", "45-134"},
                {settings, "50o 60s 10n 40s 60o", "45-110 120-135"},
                // The detector answered 0 in between, so the next run is a new onset.
                {settings, "50o 60s 2n 1o 21n 40s 60o", "45-110 129-149"},
                // Resumed into nothing but the closing pause: the joined end stays.
                {settings, "50o 60s 2n 10s 60o", "45-110"}});
}

TEST(UtteranceStream, DropsWhatTheDetectorRefused) {
  const auto settings = settings_of(16000, 2, 500);
  expect_spans({{settings, "50o 19s 80o", ""},
                {settings, "50o 20s 80o", "47-56"},
                {settings_of(16000, 1, 500), "50o 44s 80o", "45-69"},
                // A refused run neither lengthens its predecessor nor restarts the hangover.
                {settings, "50o 60s 20o 19s 80o", "47-96"},
                {settings, "50o 60s 20o 19s 11o 30s 2o", "47-96 157-176"},
                {settings, "50o 60s 20o 19s 10o 30s 2o", "47-175"},
                // Null audio does not split the detector's count of answers.
                {settings, "50o 10s 2n 20s 80o", "47-68"},
                {settings, "50o 10s 2n 9s 80o", ""},
                {settings, "50o 60s 1o 10s 2n 81o", "47-96"},
                {settings, "50o 10s 2n 15s 80o", "47-63"},
                // Refused after the hangover is over: the predecessor is handed out once.
                {settings_of(16000, 2, 100), "50o 60s 2o 10s 20n 5s 80o", "47-96"},
                // A refused run is no neighbour whose padding would meet.
                {settings_of(16000, 2, 0, 0, 1000), "50o 60s 20o 19s 80o", "47-196"}});
}

TEST(UtteranceStream, PadsUpToTheMiddleOfAGap) {
  // Speech from frame 45 to 85 and from 155 to 195: a gap of 70 frames.
  const std::string runs = "50o 60s 50o 60s 100o";
  expect_spans({{settings_of(16000, 0, 0, 100, 200), runs, "35-105 145-215"},
                {settings_of(16000, 0, 0, 350, 350), runs, "10-120 120-230"},
                {settings_of(16000, 0, 0, 1000, 1000), runs, "0-120 120-295"},
                {settings_of(16000, 0, 0, 1000, 50), runs, "0-90 120-200"},
                {settings_of(16000, 0, 0, 0, 100000), runs, "45-120 155-320"},
                {settings_of(16000, 0, 0, 0, 500), runs, "45-120 155-245"}});

  // An odd gap leaves no sample to both and none to neither.
  const auto found = utterances_of(settings_of(8000, 0, 0, 5000, 5000), frames(runs), 33);
  ASSERT_EQ(found.size(), 2u);
  EXPECT_EQ(found[0].end, found[1].start);
  EXPECT_EQ(found[1].end, 320 * 80 + 33) << "padding may use the samples that were not judged";
}

TEST(UtteranceStream, PaddingKeepsOffAPieceThatHeldNoSpeech) {
  // The neighbour that limits the first one's padding turns out to be closing pause alone.
  const auto found = utterances_of(settings_of(8000, 1, 5, 25, 15), frames("1s 2n 1s 1o 1s"));
  ASSERT_EQ(found.size(), 2u);
  EXPECT_LE(found[0].end, found[1].start);
}

TEST(UtteranceStream, TellsWhatAudioMayBeForgotten) {
  // 45-85 is handed out when its padding's room is known, 155-195 alike, 255 is still open.
  const std::string answers = frames("50o 60s 50o 60s 40o 60s");
  const int32_t frame = 160, pad_frames = 10;
  play(answers);
  const Pcm pcm = audio_for(answers, frame);
  const Stream stream = open(settings_of(16000, 0, 0, pad_frames * 10, pad_frames * 10));
  std::vector<Utterance> found;
  std::vector<std::pair<int64_t, std::size_t>> told;  // earliest start, utterances taken by then
  for (std::size_t done = 0; done < pcm.size(); take_all(stream, found)) {
    push_rest(stream, pcm, done, static_cast<std::size_t>(frame));
    told.emplace_back(EarliestUtteranceStart(stream.get()), found.size());
  }
  FlushUtteranceStream(stream.get());
  take_all(stream, found);
  play("");
  ASSERT_EQ(found.size(), 3u);
  for (const auto &[earliest, taken] : told)
    for (std::size_t i = taken; i < found.size(); ++i) EXPECT_LE(earliest, found[i].start);
  // In silence it keeps up but for the delay and the padding; in speech it waits at the start.
  EXPECT_EQ(told[39].first, (40 - 5 - pad_frames) * frame);
  EXPECT_EQ(told[100].first, found[0].start);
  EXPECT_EQ(told[150].first, (151 - 5 - pad_frames) * frame);
  EXPECT_EQ(told.back().first, found[2].start);
}

TEST(UtteranceStream, FlushClosesWhatIsOpen) {
  const std::string answers = frames("50o 30s");
  for (const int32_t content_type : {0, 2}) {
    const auto found = utterances_of(settings_of(16000, content_type, 500), answers, 159);
    ASSERT_EQ(found.size(), 1u);
    EXPECT_EQ(found[0].open, 1);
    EXPECT_EQ(found[0].end, 80 * 160) << "an end that the detector has not seen is not dated back";
  }
  play(answers + "0");
  const Pcm pcm = audio_for(script, 160);
  const Stream stream = open(settings_of(16000, 0, 500));
  EXPECT_EQ(PushUtteranceAudio(stream.get(), pcm.data(), static_cast<int32_t>(pcm.size()) - 3),
            80 * 160 + 157);
  EXPECT_EQ(FlushUtteranceStream(stream.get()), 157);
  EXPECT_EQ(FlushUtteranceStream(stream.get()), 157);
  std::vector<Utterance> found;
  take_all(stream, found);
  EXPECT_EQ(found.size(), 1u);
  EXPECT_EQ(PushUtteranceAudio(stream.get(), pcm.data(), 3), -1);
  play("");
}

std::vector<std::array<int64_t, 6>> fields(const std::vector<Utterance> &utterances) {
  std::vector<std::array<int64_t, 6>> all;
  for (const Utterance &u : utterances)
    all.push_back({u.start, u.end, u.began, u.ended, u.number, u.open});
  return all;
}

TEST(UtteranceStream, StopsWhenTheQueueIsFullAndLosesNothing) {
  std::string runs = "50o";
  for (int i = 0; i < 40; ++i) runs += " 30s 10o";
  const std::string answers = frames(runs + " 30s");  // still open at the end
  const auto settings = settings_of(16000, 0, 0);
  const auto expected = utterances_of(settings, answers);
  ASSERT_EQ(expected.size(), 41u);

  play(answers);
  const Pcm pcm = audio_for(answers, 160);
  const Stream stream = open(settings);
  std::size_t done = 0;
  push_rest(stream, pcm, done);
  EXPECT_LT(done, pcm.size());
  const std::size_t full = done;
  push_rest(stream, pcm, done);
  EXPECT_EQ(done, full);
  std::vector<Utterance> found;
  while (done < pcm.size()) {  // one out, some in: the queue stays full to the end
    ASSERT_EQ(NextUtterance(stream.get(), &found.emplace_back()), 1);
    push_rest(stream, pcm, done);
  }
  EXPECT_EQ(FlushUtteranceStream(stream.get()), 0);
  take_all(stream, found);
  EXPECT_EQ(fields(found), fields(expected));
  EXPECT_EQ(found.back().open, 1);
  play("");
}

TEST(UtteranceStream, FlushHasRoomBesideAFullQueue) {
  std::string runs = "50o";
  for (int i = 0; i < 40; ++i) runs += " 30s 10o";
  const std::string answers = frames(runs);
  play(answers);
  const Pcm pcm = audio_for(answers, 160);
  // So much padding that an utterance waits for its neighbour: one more is open behind the full
  // queue.
  const Stream stream = open(settings_of(16000, 0, 0, 0, 100000));
  std::size_t done = 0;
  push_rest(stream, pcm, done);
  ASSERT_LT(done, pcm.size());
  FlushUtteranceStream(stream.get());
  std::vector<Utterance> found;
  take_all(stream, found);
  ASSERT_EQ(found.size(), UTTERANCE_QUEUE_LENGTH + 1u);
  for (std::size_t i = 0; i < found.size(); ++i) {
    EXPECT_EQ(found[i].number, static_cast<int>(i) + 1);
    EXPECT_EQ(found[i].began, static_cast<int64_t>(51 + 40 * i) * 160);
  }
  play("");
}

TEST(UtteranceStream, AnswersDoNotDependOnTheCut) {
  auto generator = orvalis::test::seeded_generator();
  Pcm pcm = orvalis::test::speech_16k(orvalis::test::kSentences[1]);
  for (const int at : {20000, 30000}) std::fill_n(pcm.begin() + at, 5000, std::int16_t{0});

  const auto settings = settings_of(16000, 2, 200, 300, 150);
  const auto push_all = [&](auto &&piece_length) {
    const Stream stream = open(settings);
    std::vector<Utterance> found;
    for (std::size_t done = 0; done < pcm.size(); take_all(stream, found))
      push_rest(stream, pcm, done, piece_length());
    FlushUtteranceStream(stream.get());
    take_all(stream, found);
    return fields(found);
  };
  const auto expected = push_all([&] { return pcm.size(); });
  ASSERT_GE(expected.size(), 2u);
  for (int round = 0; round < 1000; ++round) {
    // Pieces from single samples to several seconds.
    std::uniform_real_distribution<double> exponent(0, round % 3 == 0 ? 2.5 : 5);
    ASSERT_EQ(
        push_all([&] { return static_cast<std::size_t>(std::pow(10.0, exponent(generator))); }),
        expected)
        << "round " << round;
  }
}

TEST(UtteranceStream, RefusesBadArgumentsAndWantOfMemory) {
  const UtteranceSettings good = UTTERANCE_SETTINGS_DEFAULT;
  for (int32_t UtteranceSettings::*field :
       {&UtteranceSettings::rate_hz, &UtteranceSettings::input_gain,
        &UtteranceSettings::hangover_ms, &UtteranceSettings::pad_before_ms,
        &UtteranceSettings::pad_after_ms}) {
    UtteranceSettings bad = good;
    bad.*field = -1;
    EXPECT_EQ(OpenUtteranceStream(&bad), nullptr);
  }
  for (const UtteranceSettings &bad :
       {UtteranceSettings{44100, 0, 0, 500, 0, 0, 0}, {8000, 3, 0, 500, 0, 0, 0}})
    EXPECT_EQ(OpenUtteranceStream(&bad), nullptr);
  EXPECT_EQ(OpenUtteranceStream(nullptr), nullptr);

  const UtteranceSettings largest = settings_of(16000, 0, INT32_MAX, INT32_MAX, INT32_MAX);
  for (int granted = 0; granted < 2; ++granted) {
    const auto memory = orvalis::test::ScriptedMalloc::failing(granted);
    EXPECT_EQ(OpenUtteranceStream(&largest), nullptr) << granted;
  }
  const Stream stream = open(largest);
  ASSERT_NE(stream, nullptr);
  const int16_t sample = 1;
  Utterance none;
  EXPECT_EQ(PushUtteranceAudio(nullptr, &sample, 1), -1);
  EXPECT_EQ(PushUtteranceAudio(stream.get(), nullptr, 1), -1);
  EXPECT_EQ(PushUtteranceAudio(stream.get(), &sample, -1), -1);
  EXPECT_EQ(PushUtteranceAudio(stream.get(), nullptr, 0), 0);
  EXPECT_EQ(NextUtterance(nullptr, &none), -1);
  EXPECT_EQ(NextUtterance(stream.get(), nullptr), -1);
  EXPECT_EQ(NextUtterance(stream.get(), &none), 0);
  EXPECT_EQ(EarliestUtteranceStart(nullptr), -1);
  EXPECT_EQ(FlushUtteranceStream(nullptr), -1);
  EXPECT_EQ(CloseUtteranceStream(nullptr), -1);
}

}  // namespace
