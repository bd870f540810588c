// `orvalis vad`: inputs and options; traces of both detectors.
#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <string>
#include <utility>
#include <vector>

#include "Voice_Engine/MCRAvad/MCRAvad.h"
#include "jni/orvalis.h"
#include "tests/cli/tool.h"
#include "tests/support/recordings.h"

namespace orvalis::test {
namespace {

using Decisions = std::vector<bool>;

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

Decisions decisions_of(const Voice &voice, Pcm pcm) {
  VADINFO record{};
  VADINFO *vad = &record;
  initialVADINFO(&vad);
  vad->historyUpdate = voice.history;
  vad->calibrationMode = voice.calibrate;
  vad->calibrationEnable = voice.enable;
  vad->lowThresholdSelect = voice.low;
  vad->energyMargin = voice.margin;
  Decisions decisions;
  for (std::size_t at = 0; at + 160 <= pcm.size(); at += 160)
    decisions.push_back(processVAD(&vad, &pcm[at], 160, voice.exponent) == 1);
  return decisions;
}

using Vad = Tool;

TEST_F(Vad, TraceHoldsDecisionsAndTheirReasons) {
  for (const std::string &file : {kWide, kNarrow}) {
    const Pcm pcm = load_recording(file);
    for (const Voice &voice : kVoices) {
      SCOPED_TRACE(voice.options + (" " + file));
      const Decisions decisions = decisions_of(voice, pcm);
      const Result result =
          run(std::string("vad -q --trace --format json ") + voice.options + " " + file);
      EXPECT_EQ(result.err, "");
      const auto lines = json_lines(result.out);
      ASSERT_EQ(lines.size(), decisions.size());
      for (std::size_t i = 0; i < decisions.size(); ++i) {
        const Json &line = lines[i];
        ASSERT_EQ(line["frame"], i);
        ASSERT_DOUBLE_EQ(line["start"], static_cast<double>(i) * (file == kWide ? 0.01 : 0.02));
        ASSERT_EQ(line["answer"] == 1, decisions[i]) << i;
        const bool reasons =
            line["energy"].get<float>() > line["energy_threshold"].get<float>() &&
            line["smoothed_energy"].get<float>() > line["smoothed_threshold"].get<float>() &&
            line["speech_bins"] > line["speech_bins_threshold"];
        ASSERT_EQ(reasons, decisions[i]) << line;
      }
    }
  }
  const std::string csv = run("vad --trace " + kWide).out;
  EXPECT_TRUE(csv.starts_with(
      "file,frame,start,answer,energy,energy_threshold,smoothed_energy,smoothed_threshold,"
      "minimum_energy,speech_bins,speech_bins_threshold,frame_snr\n" +
      kWide + ",0,0.00,0,0,0.1,0,2,0,0,40,0\n"))
      << csv.substr(0, 300);
}

TEST_F(Vad, SegmentsFollowTheDecisions) {
  for (const std::string &file : {kWide, kNarrow, kWideOpen})
    for (const auto &[min_silence, min_speech] : {std::pair{300, 100}, {65, 200}}) {
      std::string options = "--pad-before 0 --pad-after 0 --history --format json " + file;
      if (min_silence != 300) options += " --min-silence 65 --min-speech 200";  // else the defaults
      std::vector<std::pair<int, int>> expected, found;                         // in ms
      const int frame = file == kNarrow ? 20 : 10;
      int now = 0;
      for (const bool speech : decisions_of(kVoices[1], load_recording(file))) {
        if (speech && (expected.empty() || now - expected.back().second >= min_silence))
          expected.push_back({now, now});
        now += frame;
        if (speech) expected.back().second = now;
      }
      std::erase_if(expected, [shortest = min_speech](const auto &span) {
        return span.second - span.first < shortest;
      });
      for (const Json &line : json_lines(run("vad " + options).out))
        found.push_back({std::lround(line["start"].get<double>() * 1000),
                         std::lround(line["end"].get<double>() * 1000)});
      EXPECT_EQ(found, expected) << options;
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
}

TEST_F(Vad, TraceOfEpdHoldsDecisionsAndLevels) {
  const Pcm pcm = load_recording(kWide);
  const auto lines =
      json_lines(run("epd --trace --no-lead-in --format json --content-type 2 " + kWide).out);
  ASSERT_EQ(lines.size(), pcm.size() / 160);
  SetLogSink(LogNothing, nullptr);
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
