// The utterance stream on real recordings: chunks of any size, a full queue, the end.
#include "stream/utterance_stream.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <cmath>
#include <memory>
#include <random>
#include <string>
#include <vector>

#include "Voice_Engine/MCRAvad/MCRAvad.h"
#include "Voice_Engine/channel/frame_screening.h"
#include "jni/orvalis.h"
#include "stream/frame_detector.h"
#include "stream/lead_in.h"
#include "stream/utterance_finder.h"
#include "tests/support/random.h"
#include "tests/support/recordings.h"
#include "tests/support/scripted_malloc.h"

namespace {

using orvalis::test::Pcm;

class QuietLog : public testing::Environment {
  void SetUp() override { SetLogSink(LogNothing, nullptr); }
};
const auto *const quiet_log = testing::AddGlobalTestEnvironment(new QuietLog);

struct StreamCloser {
  void operator()(UtteranceStream *stream) const { EXPECT_EQ(CloseUtteranceStream(stream), 0); }
};
using Stream = std::unique_ptr<UtteranceStream, StreamCloser>;

Stream open(const UtteranceSettings &settings) { return Stream(OpenUtteranceStream(&settings)); }

using Fields = std::array<int64_t, 6>;

Fields fields_of(const Utterance &u) {
  return {u.start, u.end, u.began, u.ended, u.number, u.open};
}

/// Takes what was decided to the end of a list.
void take_all(const Stream &stream, std::vector<Fields> &found) {
  int64_t earliest = EarliestUtteranceStart(stream.get());
  for (Utterance next; NextUtterance(stream.get(), &next) == 1;) {
    EXPECT_GE(next.start, earliest);
    EXPECT_GE(EarliestUtteranceStart(stream.get()), earliest) << "never goes back";
    earliest = EarliestUtteranceStart(stream.get());
    found.push_back(fields_of(next));
  }
}

/// Pushes what is left of the audio, as far as it is taken.
void push_rest(const Stream &stream, const Pcm &pcm, std::size_t &done,
               std::size_t chunk = INT32_MAX) {
  const std::size_t length = std::min(chunk, pcm.size() - done);
  const auto taken = PushUtteranceAudio(stream.get(), pcm.data() + done, static_cast<int>(length));
  ASSERT_GE(taken, 0);
  done += static_cast<std::size_t>(taken);
}

/// What a stream finds in audio that comes in chunks.
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

/// 15 s of read speech.
Pcm long_speech() {
  Pcm pcm;
  for (const int i : {1, 0, 2}) {
    const Pcm sentence = orvalis::test::speech_16k(orvalis::test::kSentences[i]);
    pcm.insert(pcm.end(), sentence.begin(), sentence.end());
  }
  return pcm;
}

/// Speech in which every fifth frame is null audio, which makes as many utterances as possible. The
/// first 0.2 s are left alone.
Pcm interrupted(const Pcm &speech) {
  Pcm pcm(speech.begin(), speech.begin() + 3200);
  for (std::size_t at = pcm.size(); at + 640 <= speech.size(); at += 640) {
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
  const Pcm pcm = interrupted(long_speech());
  UtteranceSettings settings = without_hangover();
  for (const int32_t lead_in : {0, 1}) {
    settings.lead_in = lead_in;
    const auto expected = utterances_of(settings, pcm, [] { return 160U; });
    ASSERT_GT(expected.size(), 5U * UTTERANCE_QUEUE_LENGTH);

    const Stream stream = open(settings);
    std::size_t done = 0;
    push_rest(stream, pcm, done);
    const std::size_t full = done;
    EXPECT_LT(full, pcm.size());
    EXPECT_EQ(full == 160000, lead_in == 1) << "the first 10 s are held";
    push_rest(stream, pcm, done);
    EXPECT_EQ(done, full);
    std::vector<Fields> found;
    while (done < pcm.size()) {  // one out, some in: the queue stays full to the end
      Utterance next;
      ASSERT_EQ(NextUtterance(stream.get(), &next), 1);
      found.push_back(fields_of(next));
      push_rest(stream, pcm, done);
    }
    EXPECT_EQ(FlushUtteranceStream(stream.get()), 0);
    take_all(stream, found);
    EXPECT_EQ(found, expected);
  }
}

TEST(UtteranceStream, FlushHasRoomBesideAFullQueue) {
  Pcm pcm = interrupted(long_speech());
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

/// What was decided on which frame, with its energy and noise.
struct Frames {
  std::vector<int64_t> starts;
  std::vector<bool> speech;
  std::vector<std::array<double, 2>> reasons;
  Pcm pcm;

  void take(const EpdReasons &why) {
    reasons.push_back({static_cast<double>(why.energy), why.noiseFloor});
  }
  void take(const McraReasons &why) { reasons.push_back({why.energy, why.minEnergy}); }

  void observe(UtteranceSettings &settings) {
    settings.user = this;
    settings.on_frame = [](const UtteranceFrame *frame, void *user) {
      auto &frames = *static_cast<Frames *>(user);
      frames.starts.push_back(frame->start);
      frames.speech.push_back(frame->speech == 1);
      frames.pcm.insert(frames.pcm.end(), frame->pcm, frame->pcm + frame->samples);
      EXPECT_NE(frame->epd == nullptr, frame->mcra == nullptr);
      frame->epd != nullptr ? frames.take(*frame->epd) : frames.take(*frame->mcra);
    };
  }
};

/// What a detector makes of the whole frames of some audio, without a stream.
Frames judged_alone(const UtteranceSettings &settings, Pcm pcm) {
  const int32_t frame = orvalis::decision_timing(settings).frame_samples;
  const auto count = static_cast<int32_t>(pcm.size()) / frame;
  Frames frames;
  if (settings.detector == UTTERANCE_MCRA) {
    VADINFO record{};
    VADINFO *vad = &record;
    initialVADINFO(&vad);
    McraReasons why{};
    for (int32_t i = 0; i < count; ++i) {
      frames.speech.push_back(processVAD(&vad, &pcm[i * frame], frame, 0.84F) == 1);
      explainVAD(&vad, &why);
      frames.take(why);
    }
    return frames;
  }
  EpdInstance *epd = InitializeEPD(settings.rate_hz == 8000 ? 1000 : 0, 0);
  EpdReasons why{};
  if (settings.lead_in == 1) {
    const int16_t *window = orvalis::quietest_window(pcm.data(), std::min(count, 1000), frame);
    for (int32_t i = 0; window != nullptr && i < 60; ++i) {
      int16_t played[160];
      orvalis::make_lead_in_frame(window, frame, i, played);
      ProcessEPDFrame(epd, played, frame);
    }
    ResetEPDparams(epd);
  }
  for (int32_t i = 0; i < count; ++i) {
    frames.speech.push_back(ProcessEPDFrameExplained(epd, &pcm[i * frame], frame, 0, &why) == 1);
    frames.take(why);
  }
  FreeMemoryEPD(epd);
  return frames;
}

/// What the finder makes of decisions.
std::vector<Fields> utterances_of(const UtteranceSettings &settings, const Pcm &pcm,
                                  const std::vector<bool> &decisions) {
  const auto timing = orvalis::decision_timing(settings);
  orvalis::UtteranceFinder finder(orvalis::finder_settings(settings, timing));
  orvalis::UtteranceQueue queue;
  std::vector<Fields> found;
  const auto take = [&] {
    for (Utterance next; queue.pop(next);) found.push_back(fields_of(next));
  };
  const int16_t *frame = pcm.data();
  for (const bool speech : decisions) {
    int32_t small_samples = 0;
    const bool is_null = settings.detector == UTTERANCE_CHANNEL_ENERGY &&
                         orvalis::is_null_frame(frame, timing.frame_samples, small_samples);
    finder.process(speech, is_null, queue);
    take();
    frame += timing.frame_samples;
  }
  finder.finish(std::ssize(pcm), queue);
  take();
  return found;
}

TEST(UtteranceStream, HandsADetectorsDecisionsToTheFinder) {
  const Pcm narrow = orvalis::test::speech_8k("wav/all.wav");
  const Pcm command = orvalis::test::speech_16k("goforward.raw");
  const Pcm bursts = interrupted(orvalis::test::speech_16k(orvalis::test::kSentences[0]));
  const Pcm bursts_alone(bursts.begin() + 3200, bursts.end());
  const struct {
    int32_t rate_hz, detector, lead_in;
    const Pcm &pcm;
    std::size_t min_found;
  } kCases[] = {{16000, UTTERANCE_CHANNEL_ENERGY, 0, command, 1},
                {8000, UTTERANCE_CHANNEL_ENERGY, 0, narrow, 5},
                {16000, UTTERANCE_CHANNEL_ENERGY, 1, command, 1},
                {8000, UTTERANCE_CHANNEL_ENERGY, 1, narrow, 5},
                // Far more than the queue holds, with the flush; the second has no lead-in.
                {16000, UTTERANCE_CHANNEL_ENERGY, 1, bursts, 100},
                {16000, UTTERANCE_CHANNEL_ENERGY, 1, bursts_alone, 100},
                {16000, UTTERANCE_MCRA, 0, command, 1},
                {8000, UTTERANCE_MCRA, 0, narrow, 5}};
  for (const auto &[rate_hz, detector, lead_in, pcm, min_found] : kCases) {
    UtteranceSettings settings = UTTERANCE_SETTINGS_DEFAULT;
    settings.rate_hz = rate_hz;
    settings.detector = detector;
    settings.lead_in = lead_in;
    settings.hangover_ms = min_found < 100 ? 200 : 0;
    settings.min_speech_ms = min_found < 100 ? 700 : 0;
    const Frames alone = judged_alone(settings, pcm);
    Frames frames;
    frames.observe(settings);
    const auto found = utterances_of(settings, pcm, [] { return 1000U; });
    EXPECT_EQ(found, utterances_of(settings, pcm, alone.speech));
    EXPECT_GE(found.size(), min_found);
    EXPECT_EQ(frames.speech, alone.speech);
    EXPECT_EQ(frames.reasons, alone.reasons);
    EXPECT_EQ(frames.pcm, Pcm(pcm.begin(), pcm.begin() + std::ssize(frames.pcm)));
    for (std::size_t i = 0; i < frames.starts.size(); ++i)
      ASSERT_EQ(frames.starts[i] * std::ssize(frames.starts),
                static_cast<int64_t>(i * frames.pcm.size()));
  }
}

TEST(UtteranceStream, NoSettingDependsOnTheCut) {
  auto generator = orvalis::test::seeded_generator();
  const auto up_to = [&](int most) {
    return std::uniform_int_distribution<int>(0, most)(generator);
  };
  Pcm pcm = long_speech();
  for (const int at : {20000, 30000}) std::fill_n(pcm.begin() + at, 5000, std::int16_t{0});
  std::size_t found = 0;
  for (int round = 0; round < 30; ++round) {
    UtteranceSettings settings = UTTERANCE_SETTINGS_DEFAULT;
    settings.detector = up_to(1);
    settings.rate_hz = up_to(1) == 1 ? 16000 : 8000;
    settings.lead_in = settings.detector == UTTERANCE_MCRA ? 0 : up_to(1);
    settings.content_type = settings.detector == UTTERANCE_MCRA ? 0 : up_to(2);
    settings.hangover_ms = up_to(400);
    settings.min_speech_ms = up_to(1) * up_to(800);
    settings.pad_before_ms = up_to(300);
    settings.pad_after_ms = up_to(300);
    const auto expected = utterances_of(settings, pcm);
    found += expected.size();
    for (const double longest : {2.5, 5.0}) {  // chunks from single samples to several seconds
      std::uniform_real_distribution<double> exponent(0, longest);
      const auto chunk = [&] {
        return static_cast<std::size_t>(std::pow(10, exponent(generator)));
      };
      ASSERT_EQ(utterances_of(settings, pcm, chunk), expected) << "round " << round;
    }
  }
  EXPECT_GT(found, 100U);
}

TEST(UtteranceStream, RefusesBadArgumentsAndWantOfMemory) {
  using Settings = UtteranceSettings;
  const Settings good = UTTERANCE_SETTINGS_DEFAULT;
  Settings mcra = good;
  mcra.detector = UTTERANCE_MCRA;
  const struct {
    Settings settings;
    int32_t Settings::*field;
    int32_t value;
  } kRefused[] = {{good, &Settings::rate_hz, 44100},    {good, &Settings::input_gain, -1},
                  {good, &Settings::input_gain, 3},     {good, &Settings::hangover_ms, -1},
                  {good, &Settings::pad_before_ms, -1}, {good, &Settings::pad_after_ms, -1},
                  {good, &Settings::min_speech_ms, -1}, {good, &Settings::detector, -1},
                  {good, &Settings::detector, 2},       {mcra, &Settings::input_gain, 1},
                  {mcra, &Settings::content_type, 1},   {mcra, &Settings::pcm_dump, 1},
                  {mcra, &Settings::lead_in, 1},        {good, &Settings::lead_in, 2},
                  {good, &Settings::lead_in, -1}};
  for (auto [settings, field, value] : kRefused) {
    settings.*field = value;
    EXPECT_EQ(OpenUtteranceStream(&settings), nullptr) << value;
  }
  const McraSettings configuration = MCRA_SETTINGS_DEFAULT;
  mcra.mcra = &configuration;
  EXPECT_NE(open(mcra), nullptr);
  mcra.detector = UTTERANCE_CHANNEL_ENERGY;
  EXPECT_EQ(open(mcra), nullptr) << "a configuration of another detector";
  EXPECT_EQ(OpenUtteranceStream(nullptr), nullptr);

  UtteranceSettings largest = good;
  largest.hangover_ms = largest.pad_before_ms = largest.pad_after_ms = INT32_MAX;
  for (const int32_t detector : {UTTERANCE_MCRA, UTTERANCE_CHANNEL_ENERGY}) {
    largest.detector = detector;
    int granted = 0;
    for (bool opened = false; !opened && granted < 9; granted += !opened) {
      const auto memory = orvalis::test::ScriptedMalloc::failing(granted);
      opened = open(largest) != nullptr;
    }
    EXPECT_GE(granted, 1);
    EXPECT_LT(granted, 9);
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
