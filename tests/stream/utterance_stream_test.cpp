// The utterance stream on scripted answers, where every number of its rules is known, and on real
// recordings cut at random. Linked with --wrap for the frame call and malloc.
#include "stream/utterance_stream.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <cmath>
#include <memory>
#include <random>
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
  return {rate, 0, content_type, hangover_ms, pad_before_ms, pad_after_ms};
}

std::string run(char answer, int frames) {
  return std::string(static_cast<std::size_t>(frames), answer);
}

std::vector<Utterance> take_all(UtteranceStream *stream) {
  std::vector<Utterance> found;
  for (Utterance next; NextUtterance(stream, &next) == 1;) found.push_back(next);
  return found;
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
  std::size_t done = 0;
  while (done < pcm.size()) {
    const int32_t taken =
        PushUtteranceAudio(stream.get(), &pcm[done], static_cast<int32_t>(pcm.size() - done));
    EXPECT_GE(taken, 0);
    done += static_cast<std::size_t>(taken);
    for (const Utterance &next : take_all(stream.get())) found.push_back(next);
  }
  EXPECT_EQ(FlushUtteranceStream(stream.get()), rest);
  for (const Utterance &next : take_all(stream.get())) found.push_back(next);
  play("");
  for (std::size_t i = 0; i < found.size(); ++i)
    EXPECT_EQ(found[i].number, static_cast<int>(i) + 1);
  return found;
}

/// Start and end in frames, as "start-end start-end".
std::string spans(const UtteranceSettings &settings, const std::string &answers) {
  const int32_t frame = settings.rate_hz / 100;
  std::string text;
  for (const Utterance &next : utterances_of(settings, answers)) {
    EXPECT_EQ(next.start % frame, 0);
    EXPECT_EQ(next.end % frame, 0);
    if (!text.empty()) text += ' ';
    text += std::to_string(next.start / frame) + "-" + std::to_string(next.end / frame);
  }
  return text;
}

TEST(UtteranceStream, DatesPiecesBackByTheDetectorsDelay) {
  struct Case {
    int32_t rate, content_type, start_frames, end_frames;
  };
  for (const Case &c : {Case{16000, 0, 5, 25}, Case{16000, 1, 5, 25}, Case{16000, 2, 3, 14},
                        Case{16000, -1, 3, 14}, Case{8000, 0, 5, 28}, Case{8000, 7, 3, 17}}) {
    const int32_t frame = c.rate / 100;
    const auto found = utterances_of(settings_of(c.rate, c.content_type, 500),
                                     run('0', 60) + run('1', 90) + run('0', 80));
    ASSERT_EQ(found.size(), 1u);
    EXPECT_EQ(found[0].start, (60 - c.start_frames) * frame);
    EXPECT_EQ(found[0].end, (150 - c.end_frames) * frame);
    EXPECT_EQ(found[0].began, 61 * frame);
    EXPECT_EQ(found[0].ended, 150 * frame);
    EXPECT_EQ(found[0].open, 0);
  }
}

TEST(UtteranceStream, ClipsToTheInputAndToThePreviousPiece) {
  const auto no_hangover = settings_of(16000, 0, 0);
  EXPECT_EQ(spans(no_hangover, run('0', 2) + run('1', 60) + "00"), "0-37");
  // The interrupted piece ends undated at 90; the next onset is dated back into it.
  EXPECT_EQ(spans(no_hangover, run('0', 50) + run('1', 40) + "n0" + run('1', 60) + "00"),
            "45-90 90-127");
  // A piece that is no longer than the closing pause holds no speech.
  EXPECT_EQ(spans(no_hangover, run('0', 50) + run('1', 20) + run('0', 40)), "");
}

TEST(UtteranceStream, JoinsWithinTheHangover) {
  const std::string first = run('0', 50) + run('1', 60);
  const auto answers = [&](int gap) { return first + run('0', gap) + run('1', 60) + run('0', 80); };
  EXPECT_EQ(spans(settings_of(16000, 0, 500), answers(49)), "45-194");
  EXPECT_EQ(spans(settings_of(16000, 0, 500), answers(50)), "45-85 155-195");
  EXPECT_EQ(spans(settings_of(16000, 0, 509), answers(50)), "45-85 155-195");
  EXPECT_EQ(spans(settings_of(16000, 0, 0), answers(1)), "45-85 106-146");
  EXPECT_EQ(spans(settings_of(8000, 0, 500), answers(49)), "45-191");
  EXPECT_EQ(spans(settings_of(16000, 0, 20), answers(1)), "45-146");
}

TEST(UtteranceStream, TreatsNullAudioAsSilence) {
  const auto settings = settings_of(16000, 0, 100);
  const std::string before = run('0', 50) + run('1', 60);
  // Interrupted for good: the end is the last answer 1.
  EXPECT_EQ(spans(settings, before + run('n', 100)), "45-110");
  // Resumed without a new onset: not dated back, whether joined or not.
  EXPECT_EQ(spans(settings, before + run('n', 9) + run('1', 40) + run('0', 60)), "45-134");
  EXPECT_EQ(spans(settings, before + run('n', 10) + run('1', 40) + run('0', 60)), "45-110 120-135");
  // The detector answered 0 in between, so the next run is a new onset.
  EXPECT_EQ(spans(settings, before + "nn0n" + run('n', 20) + run('1', 40) + run('0', 60)),
            "45-110 129-149");
  // Resumed into nothing but the closing pause: the joined end stays.
  EXPECT_EQ(spans(settings, before + "nn" + run('1', 10) + run('0', 60)), "45-110");
}

TEST(UtteranceStream, DropsWhatTheDetectorRefused) {
  const auto settings = settings_of(16000, 2, 500);
  EXPECT_EQ(spans(settings, run('0', 50) + run('1', 19) + run('0', 80)), "");
  EXPECT_EQ(spans(settings, run('0', 50) + run('1', 20) + run('0', 80)), "47-56");
  EXPECT_EQ(spans(settings_of(16000, 1, 500), run('0', 50) + run('1', 19 + 25) + run('0', 80)),
            "45-69");
  // A refused run neither lengthens its predecessor nor restarts the hangover.
  const std::string first = run('0', 50) + run('1', 60);
  EXPECT_EQ(spans(settings, first + run('0', 20) + run('1', 19) + run('0', 80)), "47-96");
  EXPECT_EQ(
      spans(settings, first + run('0', 20) + run('1', 19) + run('0', 11) + run('1', 30) + "00"),
      "47-96 157-176");
  EXPECT_EQ(
      spans(settings, first + run('0', 20) + run('1', 19) + run('0', 10) + run('1', 30) + "00"),
      "47-175");
  // Null audio does not split the detector's count of answers.
  EXPECT_EQ(spans(settings, run('0', 50) + run('1', 10) + "nn" + run('1', 20) + run('0', 80)),
            "47-68");
  EXPECT_EQ(spans(settings, run('0', 50) + run('1', 10) + "nn" + run('1', 9) + run('0', 80)), "");
  EXPECT_EQ(spans(settings, first + "0" + run('1', 10) + "nn0" + run('0', 80)), "47-96");
  EXPECT_EQ(spans(settings, run('0', 50) + run('1', 10) + "nn" + run('1', 15) + run('0', 80)),
            "47-63");
  // Refused after the hangover is over: the predecessor is handed out once.
  EXPECT_EQ(spans(settings_of(16000, 2, 100),
                  first + "00" + run('1', 10) + run('n', 20) + run('1', 5) + run('0', 80)),
            "47-96");
  // A refused run is no neighbour whose padding would meet.
  EXPECT_EQ(
      spans(settings_of(16000, 2, 0, 0, 1000), first + run('0', 20) + run('1', 19) + run('0', 80)),
      "47-196");
}

TEST(UtteranceStream, PadsUpToTheMiddleOfAGap) {
  // Speech from frame 45 to 85 and from 155 to 195: a gap of 70 frames.
  const std::string answers =
      run('0', 50) + run('1', 60) + run('0', 50) + run('1', 60) + run('0', 100);
  const auto padded = [&](int before_ms, int after_ms) {
    return spans(settings_of(16000, 0, 0, before_ms, after_ms), answers);
  };
  EXPECT_EQ(padded(100, 200), "35-105 145-215");
  EXPECT_EQ(padded(350, 350), "10-120 120-230");
  EXPECT_EQ(padded(1000, 1000), "0-120 120-295");
  EXPECT_EQ(padded(1000, 50), "0-90 120-200");
  EXPECT_EQ(padded(0, 100000), "45-120 155-320");
  EXPECT_EQ(padded(0, 500), "45-120 155-245");

  // An odd gap leaves no sample to both and none to neither.
  const auto found = utterances_of(settings_of(8000, 0, 0, 5000, 5000), answers, 33);
  ASSERT_EQ(found.size(), 2u);
  EXPECT_EQ(found[0].end, found[1].start);
  EXPECT_EQ(found[1].end, 320 * 80 + 33) << "padding may use the samples that were not judged";
}

TEST(UtteranceStream, FlushClosesWhatIsOpen) {
  const std::string answers = run('0', 50) + run('1', 30);
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
  EXPECT_EQ(take_all(stream.get()).size(), 1u);
  EXPECT_EQ(PushUtteranceAudio(stream.get(), pcm.data(), 3), -1);
  play("");
}

TEST(UtteranceStream, StopsWhenTheQueueIsFullAndLosesNothing) {
  std::string answers = run('0', 50);
  for (int i = 0; i < 40; ++i) answers += run('1', 30) + run('0', 10);
  answers += run('1', 30);  // still open at the end
  const auto settings = settings_of(16000, 0, 0);
  const auto expected = utterances_of(settings, answers);
  ASSERT_EQ(expected.size(), 41u);

  play(answers);
  const Pcm pcm = audio_for(answers, 160);
  const Stream stream = open(settings);
  const auto total = static_cast<int32_t>(pcm.size());
  int32_t done = PushUtteranceAudio(stream.get(), pcm.data(), total);
  EXPECT_LT(done, total);
  EXPECT_EQ(PushUtteranceAudio(stream.get(), &pcm[static_cast<std::size_t>(done)], total - done),
            0);
  std::vector<Utterance> found;
  Utterance next;
  while (done < total) {  // one out, some in: the queue stays full to the end
    ASSERT_EQ(NextUtterance(stream.get(), &next), 1);
    found.push_back(next);
    done += PushUtteranceAudio(stream.get(), &pcm[static_cast<std::size_t>(done)], total - done);
  }
  EXPECT_EQ(FlushUtteranceStream(stream.get()), 0);
  for (const Utterance &last : take_all(stream.get())) found.push_back(last);
  ASSERT_EQ(found.size(), expected.size());
  for (std::size_t i = 0; i < found.size(); ++i) EXPECT_EQ(found[i].start, expected[i].start) << i;
  EXPECT_EQ(found.back().open, 1);
  play("");
}

std::vector<std::array<int64_t, 6>> fields(const std::vector<Utterance> &utterances) {
  std::vector<std::array<int64_t, 6>> all;
  for (const Utterance &u : utterances)
    all.push_back({u.start, u.end, u.began, u.ended, u.number, u.open});
  return all;
}

TEST(UtteranceStream, AnswersDoNotDependOnTheCut) {
  auto generator = orvalis::test::seeded_generator();
  Pcm pcm = orvalis::test::speech_16k(orvalis::test::kSentences[1]);
  for (const int at : {20000, 30000}) std::fill_n(pcm.begin() + at, 5000, std::int16_t{0});

  const auto settings = settings_of(16000, 2, 200, 300, 150);
  const auto push_all = [&](auto &&piece_length) {
    const Stream stream = open(settings);
    std::vector<Utterance> found;
    for (std::size_t done = 0; done < pcm.size();) {
      const auto piece = std::min<std::size_t>(piece_length(), pcm.size() - done);
      done += static_cast<std::size_t>(
          PushUtteranceAudio(stream.get(), &pcm[done], static_cast<int32_t>(piece)));
      for (const Utterance &next : take_all(stream.get())) found.push_back(next);
    }
    FlushUtteranceStream(stream.get());
    for (const Utterance &next : take_all(stream.get())) found.push_back(next);
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

TEST(UtteranceStream, RefusesBadArguments) {
  UtteranceSettings good = UTTERANCE_SETTINGS_DEFAULT;
  for (int32_t UtteranceSettings::*field :
       {&UtteranceSettings::rate_hz, &UtteranceSettings::input_gain,
        &UtteranceSettings::hangover_ms, &UtteranceSettings::pad_before_ms,
        &UtteranceSettings::pad_after_ms}) {
    UtteranceSettings bad = good;
    bad.*field = -1;
    EXPECT_EQ(OpenUtteranceStream(&bad), nullptr);
  }
  good.rate_hz = 44100;
  EXPECT_EQ(OpenUtteranceStream(&good), nullptr);
  good.rate_hz = 8000;
  good.input_gain = 3;
  EXPECT_EQ(OpenUtteranceStream(&good), nullptr);
  EXPECT_EQ(OpenUtteranceStream(nullptr), nullptr);

  const Stream stream = open(settings_of(16000, 0, INT32_MAX, INT32_MAX, INT32_MAX));
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
  EXPECT_EQ(FlushUtteranceStream(nullptr), -1);
  EXPECT_EQ(CloseUtteranceStream(nullptr), -1);
}

TEST(UtteranceStream, OpensOnlyWithAllItsMemory) {
  const UtteranceSettings settings = UTTERANCE_SETTINGS_DEFAULT;
  for (int granted = 0; granted < 2; ++granted) {
    const auto memory = orvalis::test::ScriptedMalloc::failing(granted);
    EXPECT_EQ(OpenUtteranceStream(&settings), nullptr) << granted;
  }
  EXPECT_NE(open(settings), nullptr);
}

}  // namespace
