// Where the utterances of real recordings lie, clean and in noise: against the recordings' own
// energy and the number of words that their transcripts hold.
#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <cstdio>
#include <span>
#include <string>
#include <tuple>
#include <vector>

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

std::vector<Span> utterances_of(const Pcm &pcm, const UtteranceSettings &settings) {
  UtteranceStream *stream = OpenUtteranceStream(&settings);
  EXPECT_EQ(PushUtteranceAudio(stream, pcm.data(), static_cast<int32_t>(pcm.size())),
            static_cast<int32_t>(pcm.size()));
  FlushUtteranceStream(stream);
  std::vector<Span> spans;
  for (Utterance next; NextUtterance(stream, &next) == 1;) {
    spans.push_back({double(next.start) / settings.rate_hz, double(next.end) / settings.rate_hz});
  }
  CloseUtteranceStream(stream);
  return spans;
}

/// What the channel-energy detector itself finds.
UtteranceSettings unpadded(int32_t rate_hz = 16000) {
  UtteranceSettings settings = UTTERANCE_SETTINGS_DEFAULT;
  settings.rate_hz = rate_hz;
  settings.pad_before_ms = settings.pad_after_ms = 0;
  return settings;
}

/// The MCRA detector as `orvalis vad` takes it.
UtteranceSettings mcra() {
  UtteranceSettings settings = UTTERANCE_SETTINGS_DEFAULT;
  settings.detector = UTTERANCE_MCRA;
  settings.hangover_ms = 300;
  settings.min_speech_ms = 100;
  return settings;
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

/// Of sentences and spoken cards, at 16 kHz.
std::vector<std::string> ten_names() {
  std::vector<std::string> names(std::begin(kSentences), std::end(kSentences));
  for (const char *name : {"001", "002", "003", "004", "005"})
    names.push_back(std::string("cards/") + name + ".wav");
  return names;
}

std::vector<Pcm> ten_recordings() {
  std::vector<Pcm> recordings;
  for (const std::string &name : ten_names()) recordings.push_back(speech_16k(name));
  return recordings;
}

TEST(Recordings, EachIsOneUtteranceWhereItsSpeechIs) {
  struct Recording {
    std::string name;
    int32_t rate_hz;
  };
  std::vector<Recording> recordings = {{"goforward.raw", 16000},
                                       {"something.raw", 16000},
                                       {"tidigits/dhd.2934z.raw", 16000},
                                       {"wav/hts1a.wav", 8000},
                                       {"wav/big_dog.wav", 8000}};
  for (const std::string &name : ten_names()) recordings.push_back({name, 16000});
  // At 60 dB the noise only keeps the pauses from being null audio. The first two are for all.
  const std::tuple<NoiseColour, double, double> kNoises[] = {{NoiseColour::kWhite, 60, 0.05},
                                                             {NoiseColour::kPink, 20, 0.05},
                                                             {NoiseColour::kWhite, 20, 0.05},
                                                             {NoiseColour::kWhite, 10, 0.2},
                                                             {NoiseColour::kPink, 10, 0.2}};
  for (const auto &[name, rate_hz] : recordings) {
    const Pcm speech = rate_hz == 16000 ? speech_16k(name) : speech_8k(name);
    const Span loud = energetic_range(speech, rate_hz, 0.005);
    const Span all = energetic_range(speech, rate_hz, 0.0001);
    for (const auto &[colour, below_db, slack_s] :
         std::span(kNoises).first(rate_hz == 8000 ? 2 : 5)) {
      SCOPED_TRACE(testing::Message() << name << " in noise at " << below_db << " dB");
      const double level = speech_level(speech, rate_hz) - below_db;
      const auto found =
          utterances_of(in_noise(speech, rate_hz * 3 / 2, colour, level), unpadded(rate_hz));
      ASSERT_EQ(found.size(), 1U);
      const double start_s = found[0].start_s - 1.5, end_s = found[0].end_s - 1.5;
      EXPECT_LT(start_s, loud.start_s + slack_s / 2);
      EXPECT_GT(end_s, loud.end_s - slack_s);
      EXPECT_GT(start_s, all.start_s - 0.1);
      EXPECT_LT(end_s, all.end_s + 0.1);
    }
  }
}

/// Whether each frame of a recording is within 30 dB of the loudest.
std::vector<bool> speech_frames(const Pcm &speech) {
  const auto levels = frame_levels(speech, 160);
  const double threshold = *std::ranges::max_element(levels) - 30;
  std::vector<bool> is_speech;
  for (const double level : levels) is_speech.push_back(level >= threshold);
  return is_speech;
}

TEST(Recordings, ALeadInFindsTheFirstWordAndSpeechThroughout) {
  UtteranceSettings without = unpadded(), with = without, reference = mcra();
  with.lead_in = 1;
  reference.pad_before_ms = reference.pad_after_ms = 0;
  const auto share_found = [](const Pcm &pcm, const UtteranceSettings &settings) {
    double sum = 0;
    for (const auto &[start_s, end_s] : utterances_of(pcm, settings)) sum += end_s - start_s;
    return 16000 * sum / double(pcm.size());
  };
  Pcm all;
  for (const Pcm &speech : ten_recordings()) {
    const auto late = utterances_of(speech, without), found = utterances_of(speech, with);
    ASSERT_EQ(late.size(), 1U);
    ASSERT_EQ(found.size(), 1U);
    EXPECT_DOUBLE_EQ(late[0].start_s, 0.39) << "the detector finds nothing before";
    EXPECT_LT(found[0].start_s, 0.30);
    EXPECT_NEAR(found[0].start_s, utterances_of(speech, reference)[0].start_s, 0.135);
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

enum class Background { kWhite, kPink, kBabble };

/// Of unit power. Babble is all recordings but one over and over, equally loud.
std::vector<double> unit_background(Background kind, const std::vector<Pcm> &recordings,
                                    std::size_t without, std::size_t samples) {
  if (kind != Background::kBabble)
    return unit_noise(samples,
                      kind == Background::kWhite ? NoiseColour::kWhite : NoiseColour::kPink,
                      20260705 + static_cast<unsigned>(without));
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
  int speech = 0, kept = 0, recordings = 0;
  double beyond_s = 0;

  void take(const std::vector<bool> &is_speech, const std::vector<Span> &spans) {
    int first = 1 << 30, last = 0;
    for (int i = 0; i < std::ssize(is_speech); ++i) {
      if (!is_speech[static_cast<std::size_t>(i)]) continue;
      const double middle_s = 0.01 * i + 0.005;
      first = std::min(first, i);
      last = i + 1;
      ++speech;
      kept += std::ranges::any_of(
          spans, [=](const Span &s) { return s.start_s <= middle_s && middle_s < s.end_s; });
    }
    for (const auto &[start_s, end_s] : spans) {
      beyond_s += std::max(0.0, std::min(end_s, 0.01 * first) - start_s) +
                  std::max(0.0, end_s - std::max(start_s, 0.01 * last));
    }
    ++recordings;
  }
  double percent() const { return 100.0 * kept / speech; }
  double beyond_ms() const { return 1000 * beyond_s / recordings; }
};

TEST(Recordings, WordsAreKept) {
  const struct {
    const char *name;
    Background kind;
    double below_db;
    double min_kept[5];  // in percent, of each way below
  } kMixes[] = {{"clean", Background::kWhite, 60, {88, 96, 99, 96, 99}},
                {"white 20 dB", Background::kWhite, 20, {88, 96, 98, 95, 98}},
                {"white 10 dB", Background::kWhite, 10, {85, 95, 97, 90, 97}},
                {"white  5 dB", Background::kWhite, 5, {80, 93, 95, 74, 92}},
                {"white  0 dB", Background::kWhite, 0, {63, 80, 83, 36, 61}},
                {"pink  20 dB", Background::kPink, 20, {88, 96, 98, 95, 98}},
                {"pink  10 dB", Background::kPink, 10, {87, 95, 97, 90, 97}},
                {"pink   5 dB", Background::kPink, 5, {76, 89, 91, 73, 90}},
                {"pink   0 dB", Background::kPink, 0, {37, 59, 62, 33, 52}},
                {"babble 20 dB", Background::kBabble, 20, {88, 96, 99, 98, 99}},
                {"babble 10 dB", Background::kBabble, 10, {89, 96, 99, 99, 99}},
                {"babble  5 dB", Background::kBabble, 5, {91, 97, 99, 99, 99}},
                {"babble  0 dB", Background::kBabble, 0, {85, 91, 98, 99, 99}}};
  UtteranceSettings ways[5] = {unpadded(), UTTERANCE_SETTINGS_DEFAULT, UTTERANCE_SETTINGS_DEFAULT,
                               mcra(), mcra()};
  ways[2].lead_in = 1;
  ways[3].pad_before_ms = ways[3].pad_after_ms = 0;
  const auto recordings = ten_recordings();
  std::printf(
      "               channel energy               MCRA              beyond the words [ms]\n"
      "background       bare  padded  and lead-in    bare  padded     channel energy   MCRA\n");
  for (const auto &[name, kind, below_db, min_kept] : kMixes) {
    Coverage found[5];
    for (std::size_t r = 0; r < recordings.size(); ++r) {
      const Pcm &speech = recordings[r];
      Pcm mixed(speech.size() + 24000);
      const auto background = unit_background(kind, recordings, r, mixed.size());
      const double level = std::pow(10, (speech_level(speech, 16000) - below_db) / 20);
      for (std::size_t i = 0; i < mixed.size(); ++i)
        mixed[i] = to_sample(level * background[i] + (i < speech.size() ? speech[i] : 0));
      for (int way = 0; way < 5; ++way)
        found[way].take(speech_frames(speech), utterances_of(mixed, ways[way]));
    }
    std::printf("%-13s  %5.1f   %5.1f        %5.1f   %5.1f   %5.1f     %14.0f  %5.0f\n", name,
                found[0].percent(), found[1].percent(), found[2].percent(), found[3].percent(),
                found[4].percent(), found[2].beyond_ms(), found[4].beyond_ms());
    for (int way = 0; way < 5; ++way) EXPECT_GT(found[way].percent(), min_kept[way]) << name;
    EXPECT_GT(found[2].percent(), found[1].percent()) << name;
    EXPECT_TRUE(kind == Background::kBabble || found[2].beyond_ms() < 250) << name;
  }
}

TEST(Recordings, SteadyNoiseHoldsNoUtterance) {
  for (const int32_t rate_hz : {16000, 8000}) {
    for (const double dbfs : {-50.0, -30.0}) {
      const double level = 20 * std::log10(32768) + dbfs;
      const Pcm noise =
          in_noise({}, static_cast<std::size_t>(rate_hz) * 30, NoiseColour::kWhite, level);
      EXPECT_TRUE(utterances_of(noise, unpadded(rate_hz)).empty())
          << rate_hz << " Hz, " << dbfs << " dBFS";
    }
  }
}

}  // namespace
