// The utterance stream on real recordings: what its detectors decide, a full queue, the end. That
// nothing depends on the cut is for the fuzz target.
#include "stream/utterance_stream.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <memory>
#include <sstream>
#include <string>
#include <vector>

#include "Voice_Engine/MCRAvad/MCRAvad.h"
#include "jni/orvalis.h"
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
  return PushUtteranceAudio(stream.get(), pcm.data() + from,
                            static_cast<int32_t>(pcm.size()) - from);
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
    text << frame->start << ' ' << frame->speech;
    if (frame->epd) text << ' ' << frame->epd->energy;
    if (frame->mcra) text << ' ' << std::llround(frame->mcra->energy);
    text << '\n';
  };
  const Stream stream = open(settings);
  for (int32_t done = 0; done < std::ssize(pcm);) {
    done += push(stream, pcm, done);
    if (done == std::ssize(pcm)) FlushUtteranceStream(stream.get());
    for (const Utterance &u : take(stream))
      seen.text << "found " << u.start << ' ' << u.end << ' ' << u.began << ' ' << u.ended << ' '
                << u.number << ' ' << u.open << '\n';
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

/// Holds every decision and utterance of each way to detect.
TEST(UtteranceStream, FindsAndTellsWhatItDid) {
  const Pcm narrow = speech_8k("wav/all.wav"), wide = speech_16k("goforward.raw");
  const Pcm bursts = interrupted(), bursts_alone(bursts.begin() + 3200, bursts.end());
  const McraSettings other = {1, 1, 1, 1, 1, 0.5F};
  const struct {
    int32_t rate_hz, gain, content_type, detector, lead_in, hangover_ms, min_speech_ms;
    const McraSettings *mcra;
    const Pcm &pcm;
    std::uint64_t digest;
  } kCases[] = {
      {16000, 0, 0, UTTERANCE_CHANNEL_ENERGY, 0, 200, 700, nullptr, wide, 0xe20076cff6b3e3f2},
      {8000, 2, 2, UTTERANCE_CHANNEL_ENERGY, 0, 200, 700, nullptr, narrow, 0xf3c247f34a70955b},
      {16000, 1, 2, UTTERANCE_CHANNEL_ENERGY, 1, 200, 0, nullptr, wide, 0xeddd11e368db0eb0},
      {8000, 0, 0, UTTERANCE_CHANNEL_ENERGY, 1, 200, 700, nullptr, narrow, 0x3850f9a48937a948},
      {16000, 0, 0, UTTERANCE_CHANNEL_ENERGY, 1, 0, 0, nullptr, bursts, 0x6162e23ef902d186},
      {16000, 0, 0, UTTERANCE_CHANNEL_ENERGY, 1, 0, 0, nullptr, bursts_alone, 0x3a647dcf6f4f17d8},
      {16000, 0, 0, UTTERANCE_MCRA, 0, 200, 700, nullptr, wide, 0xb66772cf91f8268e},
      {8000, 0, 0, UTTERANCE_MCRA, 0, 200, 700, &other, narrow, 0x6b00acd7855ca333}};
  for (const auto &[rate_hz, gain, type, detector, lead_in, hangover, least, mcra, pcm, digest] :
       kCases) {
    UtteranceSettings settings = UTTERANCE_SETTINGS_DEFAULT;
    settings.rate_hz = rate_hz;
    settings.input_gain = gain;
    settings.content_type = type;
    settings.detector = detector;
    settings.lead_in = lead_in;
    settings.hangover_ms = hangover;
    settings.min_speech_ms = least;
    settings.mcra = mcra;
    const std::string report = report_of(settings, pcm);
    std::uint64_t fold = 0;
    for (const char c : report) fold = (fold ^ static_cast<std::uint8_t>(c)) * 0x100000001b3;
    EXPECT_EQ(fold, digest) << report;
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
  EXPECT_EQ(found.back().end, done) << "padded up to the end";
}

TEST(UtteranceStream, RefusesBadArgumentsAndWantOfMemory) {
  using Settings = UtteranceSettings;
  const Settings good = UTTERANCE_SETTINGS_DEFAULT;
  Settings mcra = good;
  mcra.detector = UTTERANCE_MCRA;
  const struct {
    Settings settings;
    int32_t Settings::*field;
    std::vector<int32_t> values;
  } kRefused[] = {{good, &Settings::rate_hz, {44100}},   {good, &Settings::input_gain, {-1, 3}},
                  {good, &Settings::hangover_ms, {-1}},  {good, &Settings::pad_before_ms, {-1}},
                  {good, &Settings::pad_after_ms, {-1}}, {good, &Settings::min_speech_ms, {-1}},
                  {good, &Settings::detector, {-1, 2}},  {good, &Settings::lead_in, {-1, 2}},
                  {mcra, &Settings::input_gain, {1}},    {mcra, &Settings::content_type, {1}},
                  {mcra, &Settings::pcm_dump, {1}},      {mcra, &Settings::lead_in, {1}}};
  for (auto [settings, field, values] : kRefused) {
    for (const int32_t value : values) {
      settings.*field = value;
      EXPECT_EQ(OpenUtteranceStream(&settings), nullptr) << value;
    }
  }
  const McraSettings configuration = MCRA_SETTINGS_DEFAULT;
  mcra.mcra = &configuration;
  EXPECT_NE(open(mcra), nullptr);
  mcra.detector = UTTERANCE_CHANNEL_ENERGY;
  EXPECT_EQ(open(mcra), nullptr) << "a configuration of another detector";
  EXPECT_EQ(OpenUtteranceStream(nullptr), nullptr);

  Settings largest = good;
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
  const Stream stream = open(largest);
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
  EXPECT_EQ(PushUtteranceAudio(stream.get(), &sample, 1), 1);
  EXPECT_EQ(FlushUtteranceStream(stream.get()), 1) << "behind the last whole frame";
  EXPECT_EQ(FlushUtteranceStream(stream.get()), 1);
  EXPECT_EQ(PushUtteranceAudio(stream.get(), &sample, 1), -1) << "after the flush";
  EXPECT_EQ(CloseUtteranceStream(nullptr), -1);
}

}  // namespace
}  // namespace orvalis::test
