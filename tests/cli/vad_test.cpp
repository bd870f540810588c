// `orvalis vad`: segments from answers, and what the tool makes of files; traces of both detectors.
#include <gtest/gtest.h>

#include <algorithm>
#include <random>
#include <string>
#include <vector>

#include "Voice_Engine/MCRAvad/MCRAvad.h"
#include "cli/segments.h"
#include "jni/orvalis.h"
#include "tests/cli/tool.h"
#include "tests/support/recordings.h"

namespace orvalis::test {
namespace {

using cli::Segments;
using cli::SegmentSettings;
using Answers = std::vector<bool>;

/// Border by border, as a reader of all answers would set them.
std::vector<Utterance> expected_segments(const Answers &answers, std::int64_t frame,
                                         std::int64_t samples, const SegmentSettings &settings) {
  std::vector<Utterance> found;
  for (std::size_t i = 0; i < answers.size(); ++i) {
    if (!answers[i]) continue;
    const auto start = static_cast<std::int64_t>(i) * frame;
    if (found.empty() ||
        start - found.back().end >= std::max<std::int64_t>(settings.min_silence, 1))
      found.push_back(
          {.start = start, .end = 0, .began = start + frame, .ended = 0, .number = 0, .open = 0});
    found.back().end = found.back().ended = start + frame;
  }
  if (!found.empty() && answers.back()) found.back().open = 1;
  std::erase_if(found, [&](const Utterance &u) { return u.end - u.start < settings.min_speech; });
  const std::vector<Utterance> bare = found;
  for (std::size_t i = 0; i < found.size(); ++i) {
    const auto half_gap = [&](std::size_t next) {
      return (bare[next].start - bare[next - 1].end) / 2;
    };
    const std::int64_t first = i == 0 ? 0 : bare[i - 1].end + half_gap(i);
    const std::int64_t last = i + 1 == found.size() ? samples : bare[i].end + half_gap(i + 1);
    found[i].start = std::max(bare[i].start - settings.pad_before, first);
    found[i].end = std::min(bare[i].end + settings.pad_after, last);
    found[i].number = static_cast<std::int32_t>(i) + 1;
  }
  return found;
}

bool are_same(const Utterance &a, const Utterance &b) {
  return a.start == b.start && a.end == b.end && a.began == b.began && a.ended == b.ended &&
         a.number == b.number && a.open == b.open;
}

TEST(VoiceSegments, AreJoinedLeftOutAndPadded) {
  for (unsigned seed = 0; seed < 3000; ++seed) {
    std::mt19937 random(seed);
    const auto up_to = [&](std::int64_t most) {
      return static_cast<std::int64_t>(random()) % (most + 1);
    };
    const SegmentSettings settings{up_to(60), up_to(80), up_to(70), up_to(70)};
    Answers answers;
    while (answers.size() < 100)
      answers.insert(answers.end(), static_cast<std::size_t>(1 + up_to(seed % 30)), up_to(1) == 1);
    std::vector<Utterance> found;
    Segments segments(settings, [&](const Utterance &segment) { found.push_back(segment); });
    for (const bool speech : answers) segments.hear(speech, 10);
    segments.end(7);
    const auto samples = static_cast<std::int64_t>(10 * answers.size() + 7);
    ASSERT_TRUE(
        std::ranges::equal(found, expected_segments(answers, 10, samples, settings), are_same))
        << "seed " << seed;
  }
}

TEST(VoiceSegments, AreHandedOutAsSoonAsTheyAreDecided) {
  int found = 0;
  Segments segments({20, 30, 0, 40}, [&](const Utterance &) { ++found; });
  const auto hear = [&](int frames, bool speech) {
    for (int i = 0; i < frames; ++i) segments.hear(speech, 10);
    return found;
  };
  hear(5, true);
  EXPECT_EQ(hear(7, false), 0) << "speech could still come within twice the padding";
  EXPECT_EQ(hear(1, false), 1);
  hear(3, true);
  hear(4, false);
  EXPECT_EQ(hear(1, true), 1) << "too short to be a neighbour as yet";
  EXPECT_EQ(hear(1, true), 2);
}

struct Voice {
  const char *options;
  std::int32_t history, calibrate, enable, low, margin;
  float exponent;
};

const Voice kVoices[] = {{"", 0, 0, 0, 0, 2, 0.84F},
                         {"--history", 1, 0, 0, 0, 2, 0.84F},
                         {"--calibrate --exponent 1.1", 0, 1, 1, 0, 2, 1.1F},
                         {"--margin-over-minima --energy-margin 7", 0, 0, 1, 0, 7, 0.84F},
                         {"--low-threshold --energy-margin 0", 0, 0, 0, 1, 0, 0.84F}};

Answers answers_of(const Voice &voice, Pcm pcm) {
  VADINFO record{};
  VADINFO *vad = &record;
  initialVADINFO(&vad);
  vad->historyUpdate = voice.history;
  vad->calibrationMode = voice.calibrate;
  vad->calibrationEnable = voice.enable;
  vad->lowThresholdSelect = voice.low;
  vad->energyMargin = voice.margin;
  Answers answers;
  for (std::size_t at = 0; at + 160 <= pcm.size(); at += 160)
    answers.push_back(processVAD(&vad, &pcm[at], 160, voice.exponent) == 1);
  return answers;
}

using Vad = Tool;

TEST_F(Vad, TraceGivesTheAnswersAndTheirReasons) {
  for (const std::string &file : {kWide, kNarrow}) {
    const Pcm pcm = load_recording(file);
    for (const Voice &voice : kVoices) {
      SCOPED_TRACE(voice.options + (" " + file));
      const Answers answers = answers_of(voice, pcm);
      const Result result =
          run(std::string("vad --trace --format json ") + voice.options + " " + file);
      EXPECT_EQ(result.err, "");
      const auto lines = json_lines(result.out);
      ASSERT_EQ(lines.size(), answers.size());
      for (std::size_t i = 0; i < answers.size(); ++i) {
        const Json &line = lines[i];
        ASSERT_EQ(line["frame"], i);
        ASSERT_DOUBLE_EQ(line["start"], static_cast<double>(i) * (file == kWide ? 0.01 : 0.02));
        ASSERT_EQ(line["answer"] == 1, answers[i]) << i;
        const bool reasons =
            line["energy"].get<float>() > line["energy_threshold"].get<float>() &&
            line["smoothed_energy"].get<float>() > line["smoothed_threshold"].get<float>() &&
            line["speech_bins"] > 40;
        ASSERT_EQ(reasons, answers[i]) << line;
      }
    }
  }
  const std::string csv = run("vad --trace " + kWide).out;
  EXPECT_TRUE(csv.starts_with(
      "file,frame,start,answer,energy,energy_threshold,smoothed_energy,smoothed_threshold,"
      "minimum_energy,speech_bins,frame_snr\n" +
      kWide + ",0,0.00,0,0,0.1,0,2,0,0,0\n"))
      << csv.substr(0, 300);
}

TEST_F(Vad, SegmentsFollowTheAnswers) {
  for (const std::string &file : {kWide, kNarrow, kWideOpen}) {
    const Pcm pcm = load_recording(file);
    const std::int64_t rate = file == kNarrow ? 8000 : 16000;
    for (const Voice &voice : kVoices) {
      const std::string options = std::string(voice.options) + " " + file;
      const auto matches = [&](const std::string &more, const SegmentSettings &settings) {
        SCOPED_TRACE(more + options);
        const auto lines = json_lines(run("vad --format json " + more + options).out);
        const auto expected = expected_segments(answers_of(voice, pcm), 160,
                                                static_cast<std::int64_t>(pcm.size()), settings);
        ASSERT_EQ(lines.size(), expected.size());
        for (std::size_t i = 0; i < lines.size(); ++i) {
          EXPECT_EQ(lines[i]["start_sample"], expected[i].start);
          EXPECT_EQ(lines[i]["end_sample"], expected[i].end);
          EXPECT_EQ(lines[i]["began_sample"], expected[i].began);
          EXPECT_EQ(lines[i]["open"], expected[i].open == 1);
        }
      };
      const auto ms = [&](std::int64_t time) { return time * rate / 1000; };
      matches("", {ms(100), ms(300), 0, 0});
      matches("--min-speech 200 --min-silence 60 --pad-before 50 --pad-after 400 ",
              {ms(200), ms(60), ms(50), ms(400)});
    }
  }
}

TEST_F(Vad, FormatsJobsAndRefusalsAreThoseOfEpd) {
  const std::string files = kNarrow + " missing.wav " + kWide + " 2>&1";
  for (const std::string options : {"", "--trace ", "--format csv ", "--format rttm "}) {
    const Result one = run("vad " + options + files);
    EXPECT_EQ(one.status, 1);
    EXPECT_NE(one.out.find("missing.wav"), std::string::npos);
    EXPECT_EQ(run("vad --jobs 3 " + options + files).out, one.out) << options;
  }
  const auto segments = json_lines(run("vad --format json " + kNarrow).out).size();
  const std::string labels = run("vad --format labels " + kNarrow).out;
  EXPECT_EQ(std::count(labels.begin(), labels.end(), '\n'), segments);
  const std::string samples = read_file(kNarrow).substr(kWavHeader);
  EXPECT_EQ(run("vad --raw --rate 8000 -", samples).out, run("vad " + kNarrow).out);

  for (const std::string wrong :
       {"vad --trace --format labels ", "vad --trace --pad-after 1 ", "vad --exponent 0 ",
        "vad - - ", "epd --trace --format table ", "epd --trace --frames "}) {
    const Result result = run(wrong + kWide);
    EXPECT_EQ(result.status, 2) << wrong;
    EXPECT_NE(result.err.find("orvalis: "), std::string::npos) << wrong;
  }
}

TEST_F(Vad, TraceOfEpdGivesAnswersAndLevels) {
  const Pcm pcm = load_recording(kWide);
  const auto lines = json_lines(run("epd --trace --format json --content-type 2 " + kWide).out);
  ASSERT_EQ(lines.size(), pcm.size() / 160);
  SetLogSink([](int, const char *, const char *, void *) {}, nullptr);
  EpdInstance *epd = InitializeEPD(0, 0);
  for (std::size_t i = 0; i < lines.size(); ++i) {
    const std::int16_t *frame = &pcm[i * 160];
    EXPECT_EQ(lines[i]["answer"], ProcessEPDFrameByCnttype(epd, frame, 160, 2));
    EXPECT_EQ(lines[i]["energy"], computeEnergy(frame, 160));
    EXPECT_EQ(lines[i]["peak"], std::max<int>(*std::max_element(frame, frame + 160),
                                              -*std::min_element(frame, frame + 160)));
  }
  FreeMemoryEPD(epd);
  SetLogSink(nullptr, nullptr);
}

}  // namespace
}  // namespace orvalis::test
