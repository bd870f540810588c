// The utterance stream on real recordings: cut at random, into a full queue, and to the end.
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

class QuietLog : public testing::Environment {
  void SetUp() override {
    SetLogSink([](int, const char *, const char *, void *) {}, nullptr);
  }
};
const auto *const quiet_log = testing::AddGlobalTestEnvironment(new QuietLog);

struct StreamCloser {
  void operator()(UtteranceStream *stream) const { EXPECT_EQ(CloseUtteranceStream(stream), 0); }
};
using Stream = std::unique_ptr<UtteranceStream, StreamCloser>;

Stream open(const UtteranceSettings &settings) { return Stream(OpenUtteranceStream(&settings)); }

using Fields = std::array<int64_t, 6>;

/// Takes what was decided to the end of a list.
void take_all(const Stream &stream, std::vector<Fields> &found) {
  for (Utterance u; NextUtterance(stream.get(), &u) == 1;)
    found.push_back({u.start, u.end, u.began, u.ended, u.number, u.open});
}

/// Pushes what is left of the audio, as far as it is taken.
void push_rest(const Stream &stream, const Pcm &pcm, std::size_t &done,
               std::size_t piece = INT32_MAX) {
  const std::size_t length = std::min(piece, pcm.size() - done);
  const auto taken = PushUtteranceAudio(stream.get(), pcm.data() + done, static_cast<int>(length));
  ASSERT_GE(taken, 0);
  done += static_cast<std::size_t>(taken);
}

/// What a stream finds in audio that comes in pieces.
template <class PieceLength>
std::vector<Fields> utterances_of(const UtteranceSettings &settings, const Pcm &pcm,
                                  PieceLength piece_length) {
  const Stream stream = open(settings);
  std::vector<Fields> found;
  for (std::size_t done = 0; done < pcm.size(); take_all(stream, found))
    push_rest(stream, pcm, done, piece_length());
  FlushUtteranceStream(stream.get());
  take_all(stream, found);
  return found;
}

std::vector<Fields> utterances_of(const UtteranceSettings &settings, const Pcm &pcm) {
  return utterances_of(settings, pcm, [&] { return pcm.size(); });
}

/// Speech with a null frame behind every four others, which ends utterances like nothing else.
Pcm interrupted_speech() {
  const Pcm speech = orvalis::test::speech_16k(orvalis::test::kSentences[1]);
  Pcm pcm;
  for (std::size_t at = 0; at + 640 <= speech.size(); at += 640) {
    pcm.insert(pcm.end(), &speech[at], &speech[at] + 640);
    pcm.resize(pcm.size() + 160);
  }
  return pcm;
}

UtteranceSettings without_hangover() {
  UtteranceSettings settings = UTTERANCE_SETTINGS_DEFAULT;
  settings.hangover_ms = settings.pad_before_ms = settings.pad_after_ms = 0;
  return settings;
}

TEST(UtteranceStream, StopsWhenTheQueueIsFullAndLosesNothing) {
  const Pcm pcm = interrupted_speech();
  const UtteranceSettings settings = without_hangover();
  const auto expected = utterances_of(settings, pcm, [] { return 160U; });
  ASSERT_GT(expected.size(), 2U * UTTERANCE_QUEUE_LENGTH);

  const Stream stream = open(settings);
  std::size_t done = 0;
  push_rest(stream, pcm, done);
  const std::size_t full = done;
  EXPECT_LT(full, pcm.size());
  push_rest(stream, pcm, done);
  EXPECT_EQ(done, full);
  std::vector<Fields> found;
  while (done < pcm.size()) {  // one out, some in: the queue stays full to the end
    Utterance u;
    ASSERT_EQ(NextUtterance(stream.get(), &u), 1);
    found.push_back({u.start, u.end, u.began, u.ended, u.number, u.open});
    push_rest(stream, pcm, done);
  }
  EXPECT_EQ(FlushUtteranceStream(stream.get()), 0);
  take_all(stream, found);
  EXPECT_EQ(found, expected);
}

TEST(UtteranceStream, FlushHasRoomBesideAFullQueue) {
  Pcm pcm = interrupted_speech();
  // So much padding that an utterance waits for its neighbour: one more is open behind the full
  // queue.
  UtteranceSettings settings = without_hangover();
  settings.pad_after_ms = 100000;
  const Stream stream = open(settings);
  std::size_t done = 0;
  push_rest(stream, pcm, done);
  ASSERT_LT(done, pcm.size());
  FlushUtteranceStream(stream.get());
  std::vector<Fields> found;
  take_all(stream, found);
  EXPECT_EQ(found.size(), UTTERANCE_QUEUE_LENGTH + 1U);
  pcm.resize(done);
  EXPECT_EQ(found, utterances_of(settings, pcm, [] { return 160U; }));
}

TEST(UtteranceStream, FlushEndsTheAudio) {
  Pcm pcm = orvalis::test::speech_16k(orvalis::test::kSentences[1]);
  pcm.resize(160 * 200 + 157);
  const Stream stream = open(UTTERANCE_SETTINGS_DEFAULT);
  std::size_t done = 0;
  push_rest(stream, pcm, done);
  EXPECT_EQ(FlushUtteranceStream(stream.get()), 157);
  EXPECT_EQ(FlushUtteranceStream(stream.get()), 157);
  std::vector<Fields> found;
  take_all(stream, found);
  ASSERT_EQ(found.size(), 1U);
  EXPECT_EQ(found[0][3], 160 * 200);
  EXPECT_EQ(found[0][5], 1);
  EXPECT_EQ(PushUtteranceAudio(stream.get(), pcm.data(), 3), -1);
}

TEST(UtteranceStream, AnswersDoNotDependOnTheCut) {
  auto generator = orvalis::test::seeded_generator();
  Pcm pcm = orvalis::test::speech_16k(orvalis::test::kSentences[1]);
  for (const int at : {20000, 30000}) std::fill_n(pcm.begin() + at, 5000, std::int16_t{0});

  UtteranceSettings settings = UTTERANCE_SETTINGS_DEFAULT;
  settings.content_type = 2;
  settings.hangover_ms = 200;
  const auto expected = utterances_of(settings, pcm);
  ASSERT_GE(expected.size(), 2U);
  for (int round = 0; round < 1000; ++round) {
    // Pieces from single samples to several seconds.
    std::uniform_real_distribution<double> exponent(0, round % 3 == 0 ? 2.5 : 5);
    const auto length = [&] { return static_cast<std::size_t>(std::pow(10, exponent(generator))); };
    ASSERT_EQ(utterances_of(settings, pcm, length), expected) << "round " << round;
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
  UtteranceSettings bad = good;
  bad.rate_hz = 44100;
  EXPECT_EQ(OpenUtteranceStream(&bad), nullptr);
  bad = good;
  bad.input_gain = 3;
  EXPECT_EQ(OpenUtteranceStream(&bad), nullptr);
  EXPECT_EQ(OpenUtteranceStream(nullptr), nullptr);

  UtteranceSettings largest = good;
  largest.hangover_ms = largest.pad_before_ms = largest.pad_after_ms = INT32_MAX;
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
