// The utterance stream on real recordings: what its detectors decide, a full queue, refusals. That
// nothing depends on the cut is for the fuzz target.
#include "stream/utterance_stream.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <memory>
#include <sstream>
#include <vector>

#include "Voice_Engine/MCRAvad/MCRAvad.h"
#include "jni/orvalis.h"
#include "tests/support/fold.h"
#include "tests/support/recordings.h"
#include "tests/support/scripted_malloc.h"

namespace orvalis::test {
namespace {

struct QuietLog : testing::Environment {
  void SetUp() override { SetLogSink(LogNothing, nullptr); }
};
const auto *const quiet_log = testing::AddGlobalTestEnvironment(new QuietLog);

struct StreamCloser {
  void operator()(UtteranceStream *stream) const { EXPECT_EQ(CloseUtteranceStream(stream), 0); }
};
using Stream = std::unique_ptr<UtteranceStream, StreamCloser>;
Stream open(const UtteranceSettings &settings) { return Stream(OpenUtteranceStream(&settings)); }

int32_t push(const Stream &stream, const Pcm &pcm, int32_t from = 0) {
  return PushUtteranceAudio(stream.get(), &pcm[from], static_cast<int32_t>(pcm.size()) - from);
}

/// Up to `count` of the utterances that were decided.
std::vector<Utterance> take(const Stream &stream, int count = INT32_MAX) {
  std::vector<Utterance> taken;
  for (Utterance next; count > 0 && NextUtterance(stream.get(), &next) == 1; --count)
    taken.push_back(next);
  return taken;
}

/// All that a stream finds, and what it tells of each frame, in a line each.
std::string report_of(UtteranceSettings settings, const Pcm &pcm) {
  struct Observer {
    const int16_t *expected;
    std::ostringstream text;
  } seen = {pcm.data(), {}};
  settings.user = &seen;
  settings.on_frame = [](const UtteranceFrame *frame, void *user) {
    auto &[expected, text] = *static_cast<Observer *>(user);
    EXPECT_TRUE(std::equal(frame->pcm, frame->pcm + frame->samples, expected));
    expected += frame->samples;
    text << frame->start << ' ' << frame->speech << ' '
         << (frame->epd ? frame->epd->energy : std::llround(frame->mcra->energy)) << '\n';
  };
  const Stream stream = open(settings);
  for (int32_t done = 0; done < std::ssize(pcm);) {
    done += push(stream, pcm, done);
    if (done == std::ssize(pcm)) FlushUtteranceStream(stream.get());
    for (const Utterance &u : take(stream))
      seen.text << u.number << ": " << u.start << ' ' << u.end << ' ' << u.began << ' ' << u.ended
                << ' ' << u.open << '\n';
  }
  return seen.text.str();
}

/// Speech in which every fifth frame is null audio, which makes as many utterances as possible.
Pcm interrupted() {
  Pcm pcm;
  for (const int sentence : {1, 0, 2}) {
    const Pcm speech = speech_16k(kSentences[sentence]);
    for (std::size_t at = 0; at + 640 <= speech.size(); at += 640) {
      pcm.insert(pcm.end(), &speech[at], &speech[at] + 640);
      pcm.resize(pcm.size() + (pcm.size() < 3200 ? 0 : 160));  // so that there is a lead-in
    }
  }
  return pcm;
}

/// Every decision and utterance of each way to detect, as digests.
TEST(UtteranceStream, FindsAndTellsWhatItDid) {
  const Pcm narrow = speech_8k("wav/all.wav"), wide = speech_16k("goforward.raw");
  const Pcm bursts = interrupted(), bursts_alone(bursts.begin() + 3200, bursts.end());
  const McraSettings other = {1, 1, 1, 1, 1, 0.5F};
  const struct {
    const char *settings;
    const Pcm &pcm;
    std::uint64_t digest;
  } kCases[] = {{"16000 0 0 0 0 200 700", wide, 0xd3087d7e21baa8ef},
                {"8000 2 2 0 0 200 700", narrow, 0x4a83df34fc8294fb},
                {"16000 1 2 0 1 200 0", wide, 0xa3ce7862b1787968},
                {"8000 0 0 0 1 200 700", narrow, 0x4dfaff902bf4525f},
                {"16000 0 0 0 1 0 0", bursts, 0xfa807c1ab90380c3},
                {"16000 0 0 0 1 0 0", bursts_alone, 0xeaecb73dd6f71cc9},
                {"16000 0 0 1 0 200 700", wide, 0x2494213134c35ea2},
                {"8000 0 0 1 0 200 700", narrow, 0x656752592a68e97d}};
  for (const auto &[given, pcm, digest] : kCases) {
    UtteranceSettings s = UTTERANCE_SETTINGS_DEFAULT;
    std::istringstream(given) >> s.rate_hz >> s.input_gain >> s.content_type >> s.detector >>
        s.lead_in >> s.hangover_ms >> s.min_speech_ms;
    s.pad_before_ms = s.hangover_ms / 2;
    s.pad_after_ms = s.hangover_ms;
    if (s.detector == UTTERANCE_MCRA && s.rate_hz == 8000) s.mcra = &other;
    const std::string report = report_of(s, pcm);
    EXPECT_EQ(fold(report), digest) << given << '\n' << report;
  }
}

TEST(UtteranceStream, StopsWhenTheQueueIsFull) {
  UtteranceSettings settings = UTTERANCE_SETTINGS_DEFAULT;
  settings.hangover_ms = settings.pad_before_ms = settings.pad_after_ms = 0;
  const Pcm pcm = interrupted();
  Stream stream = open(settings);
  int32_t done = push(stream, pcm);
  EXPECT_EQ(push(stream, pcm, done), 0);
  for (; done < std::ssize(pcm); done += push(stream, pcm, done)) {  // one out, some in
    const auto earliest = EarliestUtteranceStart(stream.get());
    EXPECT_EQ(take(stream, 1).at(0).start, earliest);
  }
  // With so much padding an utterance waits for its neighbour: behind a full queue one is open.
  settings.pad_after_ms = 100000;
  stream = open(settings);
  done = push(stream, pcm);
  FlushUtteranceStream(stream.get());
  const auto found = take(stream);
  EXPECT_EQ(found.size(), UTTERANCE_QUEUE_LENGTH + 1U);
  for (std::size_t i = 0; i < found.size(); ++i) EXPECT_EQ(found[i].number, int(i) + 1);
  EXPECT_EQ(found.back().end, done) << "padded up to the end";
}

TEST(UtteranceStream, RefusesBadArgumentsAndWantOfMemory) {
  using Settings = UtteranceSettings;
  UtteranceSettings settings = UTTERANCE_SETTINGS_DEFAULT;
  const auto refuses = [&](int32_t Settings::*field, int32_t value) {
    Settings changed = settings;
    changed.*field = value;
    EXPECT_EQ(open(changed), nullptr) << value;
  };
  refuses(&Settings::rate_hz, 44100);
  refuses(&Settings::input_gain, 3);
  for (const auto field :
       {&Settings::input_gain, &Settings::hangover_ms, &Settings::pad_before_ms,
        &Settings::pad_after_ms, &Settings::min_speech_ms, &Settings::detector, &Settings::lead_in})
    refuses(field, -1);
  for (const auto field : {&Settings::detector, &Settings::lead_in}) refuses(field, 2);
  const McraSettings configuration = MCRA_SETTINGS_DEFAULT;
  settings.mcra = &configuration;
  EXPECT_EQ(open(settings), nullptr) << "a configuration of another detector";
  settings.detector = UTTERANCE_MCRA;
  EXPECT_NE(open(settings), nullptr);
  for (const auto field :
       {&Settings::input_gain, &Settings::content_type, &Settings::pcm_dump, &Settings::lead_in})
    refuses(field, 1);
  EXPECT_EQ(OpenUtteranceStream(nullptr), nullptr);

  Settings largest = UTTERANCE_SETTINGS_DEFAULT;
  largest.hangover_ms = largest.pad_before_ms = largest.pad_after_ms = INT32_MAX;
  for (const int32_t detector : {UTTERANCE_MCRA, UTTERANCE_CHANNEL_ENERGY}) {
    largest.detector = detector;
    int granted = 0;
    for (bool opened = false; !opened && granted < 9; granted += !opened) {
      const auto memory = ScriptedMalloc::failing(granted);
      opened = open(largest) != nullptr;
    }
    EXPECT_TRUE(granted > 0 && granted < 9);
  }
  const Stream open_one = open(largest);
  UtteranceStream *const stream = open_one.get();
  const int16_t sample = 1;
  Utterance none;
  for (const int32_t result :
       {PushUtteranceAudio(nullptr, &sample, 1), PushUtteranceAudio(stream, nullptr, 1),
        PushUtteranceAudio(stream, &sample, -1), NextUtterance(nullptr, &none),
        NextUtterance(stream, nullptr), FlushUtteranceStream(nullptr),
        CloseUtteranceStream(nullptr), static_cast<int32_t>(EarliestUtteranceStart(nullptr))})
    EXPECT_EQ(result, -1);
  EXPECT_EQ(PushUtteranceAudio(stream, nullptr, 0), 0);
  EXPECT_EQ(NextUtterance(stream, &none), 0);
  EXPECT_EQ(PushUtteranceAudio(stream, &sample, 1), 1);
  for (int i = 0; i < 2; ++i) EXPECT_EQ(FlushUtteranceStream(stream), 1) << "no whole frame";
  EXPECT_EQ(PushUtteranceAudio(stream, &sample, 1), -1) << "after the flush";
}

}  // namespace
}  // namespace orvalis::test
