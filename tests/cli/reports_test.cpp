// What the tool reports: utterances and silences in every format, statistics, the traces of both
// detectors, and queries.
#include <fmt/format.h>
#include <fmt/ranges.h>
#include <gtest/gtest.h>

#include <cstdlib>

#include "Voice_Engine/MCRAvad/MCRAvad.h"
#include "cli/report.h"
#include "jni/orvalis.h"
#include "tests/cli/tool.h"

namespace orvalis::test {
namespace {

using Reports = Tool;

/// What a format makes of a file of 1 s at 8 kHz.
template <class Find>
std::string in_format(const std::string &format, cli::Reported reported, Find find) {
  cli::Console console;
  testing::internal::CaptureStdout();
  const auto report = std::ranges::find(cli::report_formats(), format, &cli::ReportFormat::name)
                          ->make(console, true);
  report->begin_file("in/two, \"three\".wav", 8000, reported);
  find(*report);
  report->end_file(8000);
  return testing::internal::GetCapturedStdout();
}

TEST(Formats, HoldUtterancesAndSilences) {
  const std::string name = "in/two, \"three\".wav", csv = "\"in/two, \"\"three\"\".wav\"",
                    rttm = " two,_\"three\" 1 ",
                    json = R"({"file":"in/two, \"three\".wav","rate":8000,)";
  const std::string columns = "     start       end  duration\n";
  const auto grid = [](const std::string &text) {
    return "File type = \"ooTextFile\"\nObject class = \"TextGrid\"\n\nxmin = 0\nxmax = 1.000000\n"
           "tiers? <exists>\nsize = 1\nitem []:\n    item [1]:\n        class = \"IntervalTier\"\n"
           "        name = \"orvalis\"\n        xmin = 0\n        xmax = 1.000000\n"
           "        intervals: size = 3\n        intervals [1]:\n            xmin = 0.000000\n"
           "            xmax = 0.100000\n            text = \"\"\n        intervals [2]:\n"
           "            xmin = 0.100000\n            xmax = 0.300000\n            text = \"" +
           text +
           "\"\n        intervals [3]:\n            xmin = 0.300000\n            xmax = 1.000000\n"
           "            text = \"\"\n\n";
  };
  const struct {
    std::string format, utterance, silence;
  } kCases[] = {
      {"table", name + "\nutterance" + columns + "        7     0.100     0.300     0.200  open\n",
       name + "\n  silence" + columns + "        8     0.100     0.300     0.200\n"},
      {"json",
       json + R"("number":7,"start":0.1,"end":0.3,"duration":0.2,"began":0.15,"ended":0.25,)" +
           R"("start_sample":800,"end_sample":2400,"began_sample":1200,"ended_sample":2000,)" +
           "\"open\":true}\n",
       json + R"("silence":8,"start":0.1,"end":0.3,"duration":0.2,)" +
           "\"start_sample\":800,\"end_sample\":2400}\n"},
      {"csv",
       "file,number,start,end,duration,began,ended,open\n" + csv +
           ",7,0.100000,0.300000,0.200000,0.150000,0.250000,1\n",
       "file,silence,start,end,duration\n" + csv + ",8,0.100000,0.300000,0.200000\n"},
      {"labels", "0.100000\t0.300000\tutterance 7\n", "0.100000\t0.300000\tsilence 8\n"},
      {"textgrid", grid("speech"), grid("silence")},
      {"rttm", "SPEAKER" + rttm + "0.100 0.200 <NA> <NA> speech <NA> <NA>\n",
       "NON-SPEECH" + rttm + "0.100 0.200 <NA> other <NA> <NA> <NA>\n"}};
  for (const auto &[format, utterance, silence] : kCases) {
    EXPECT_EQ(in_format(format, cli::Reported::kUtterances,
                        [](auto &report) {
                          report.utterance({800, 2400, 1200, 2000, 7, 1});
                        }),
              utterance);
    EXPECT_EQ(in_format(format, cli::Reported::kSilences,
                        [](auto &report) {
                          report.silence({8, 800, 2400});
                        }),
              silence);
  }
}

TEST_F(Reports, SilencesAndStatisticsFollowFromTheUtterances) {
  // Neighbours at full scale where the tool reads the next chunk, and at the end.
  Pcm clipped(16000, 1);
  for (const int i : {798, 800, 801, 804, 805, 15995, 15997, 15999})
    clipped[static_cast<std::size_t>(i)] = static_cast<short>(i % 2 == 0 ? -32767 : 32767);
  const std::string none = wav("none.wav", {}), files = kNarrow + " " + kWideOpen + " " +
                                                        wav("clipped.wav", clipped) + " " + none;
  std::string expected = "   length    speech    share  utterances   clipped  file\n";
  std::vector<int> all_clipped;
  for (const Json &line : epd("-j 2 --stats " + files)) {
    const std::string file = line["file"];
    const double length = line["length"], share = line["share"];
    double speech = 0;
    std::int64_t start = 0;
    std::vector<std::pair<std::int64_t, std::int64_t>> between, silences;
    const auto found = epd(file);
    for (const Json &utterance : found) {
      speech += utterance["duration"].get<double>();
      between.emplace_back(start, utterance["start_sample"]);
      start = utterance["end_sample"];
    }
    between.emplace_back(start, std::ssize(read_audio(file).samples));
    std::erase_if(between, [](const auto &span) { return span.first == span.second; });
    for (const Json &silence : epd("--silences " + file)) {
      silences.emplace_back(silence["start_sample"], silence["end_sample"]);
      EXPECT_EQ(silence["silence"], silences.size());
    }
    EXPECT_EQ(silences, between);
    EXPECT_NEAR(line["speech"], speech, 1e-9);
    EXPECT_DOUBLE_EQ(share, length > 0 ? speech / length : 0);
    EXPECT_EQ(line["utterances"], found.size());
    all_clipped.push_back(line["clipped"]);
    expected += fmt::format("{:9.3f} {:9.3f} {:7.1f}% {:11} {:9}  {}\n", length, speech,
                            100 * share, found.size(), all_clipped.back(), file);
  }
  EXPECT_EQ(all_clipped, (std::vector{0, 0, 6, 0}));
  EXPECT_EQ(run("epd -q --stats " + files).out, expected);
  EXPECT_EQ(
      run("vad -q --stats --format csv " + none).out,
      "file,length,speech,share,utterances,clipped\n" + none + ",0.000000,0.000000,0.000000,0,0\n");
  EXPECT_EQ(run("epd " + wav("silence.wav", Pcm(50000), 48000)).out, "no utterance\n");
  EXPECT_EQ(run("epd --silences - <" + none).out, "no silence\n");
  EXPECT_NE(run("epd -f textgrid " + kNarrow).out.find("\nxmax = 57.114000\n"), std::string::npos);
}

TEST_F(Reports, FramesAndTraceOfEpdAgreeWithUtterances) {
  const std::string options = "--content-type 2 " + kWide;
  const auto frames = epd("--frames " + options), trace = epd("--trace " + options);
  const auto utterances = epd(options);
  const Pcm pcm = load_recording(kWide);
  ASSERT_EQ(frames.size(), pcm.size() / 160);
  ASSERT_EQ(trace.size(), frames.size());
  std::vector<std::size_t> speech;
  for (std::size_t i = 0; i < frames.size(); ++i) {
    Json expected = {{"file", kWide}, {"rate", 16000}, {"frame", i}};
    expected.update({{"start", static_cast<double>(i) / 100}, {"answer", trace[i]["answer"]}});
    EXPECT_EQ(frames[i], expected);
    EXPECT_EQ(trace[i]["start"], expected["start"]);
    EXPECT_EQ(trace[i]["energy"], computeEnergy(&pcm[i * 160], 160));
    int peak = 0;
    for (std::size_t at = i * 160; at < i * 160 + 160; ++at)
      peak = std::max(peak, std::abs(pcm[at]));
    EXPECT_EQ(trace[i]["peak"], peak);
    if (frames[i]["answer"] == 1) speech.push_back(i);
  }
  EXPECT_EQ((speech.at(0) + 1) * 160, utterances.at(0)["began_sample"]);
  EXPECT_EQ((speech.back() + 1) * 160, utterances.back()["ended_sample"]);
  EXPECT_TRUE(
      run("epd --frames " + kWide)
          .out.starts_with("    frame     start    answer\n        0      0.00         0\n"));
  EXPECT_TRUE(run("epd --frames --format csv " + kWide)
                  .out.starts_with("file,frame,start,answer\n" + kWide + ",0,0.00,0\n"));
}

TEST_F(Reports, OptionsOfVadReachItsDetector) {
  const struct {
    const char *options;
    std::int32_t history, calibrate, enable, low, margin;
    float exponent;
  } kVoices[] = {{"", 0, 0, 0, 0, 2, 0.84F},
                 {"--history", 1, 0, 0, 0, 2, 0.84F},
                 {"--calibrate --exponent 1.1", 0, 1, 1, 0, 2, 1.1F},
                 {"--margin-over-minima --energy-margin 7", 0, 0, 1, 0, 7, 0.84F},
                 {"--low-threshold --energy-margin 0", 0, 0, 0, 1, 0, 0.84F}};
  for (const auto &voice : kVoices) {
    SCOPED_TRACE(voice.options);
    Pcm pcm = load_recording(kWide);  // is changed
    VADINFO record{};
    VADINFO *vad = &record;
    initialVADINFO(&vad);
    vad->historyUpdate = voice.history;
    vad->calibrationMode = voice.calibrate;
    vad->calibrationEnable = voice.enable;
    vad->lowThresholdSelect = voice.low;
    vad->energyMargin = voice.margin;
    const auto lines = json_lines(
        run(std::string("vad -q --trace --format json ") + voice.options + " " + kWide).out);
    ASSERT_EQ(lines.size(), pcm.size() / 160);
    for (std::size_t i = 0; i < lines.size(); ++i) {
      const Json &line = lines[i];
      ASSERT_DOUBLE_EQ(line["start"], static_cast<double>(i) * 0.01);
      const bool speech = processVAD(&vad, &pcm[i * 160], 160, voice.exponent) == 1;
      ASSERT_EQ(line["answer"] == 1, speech) << i;
      const auto above = [&line](const char *value, const char *threshold) {
        return line[value].get<float>() > line[threshold].get<float>();
      };
      ASSERT_EQ(above("energy", "energy_threshold") &&
                    above("smoothed_energy", "smoothed_threshold") &&
                    above("speech_bins", "speech_bins_threshold"),
                speech)
          << line;
    }
  }
  EXPECT_TRUE(
      run("vad --trace " + kWide)
          .out.starts_with(
              "file,frame,start,answer,energy,energy_threshold,smoothed_energy,smoothed_threshold,"
              "minimum_energy,speech_bins,speech_bins_threshold,frame_snr\n" +
              kWide + ",0,0.00,0,0,0.1,0,2,0,0,40,0\n"));
}

TEST_F(Reports, SegmentsOfVadFollowItsDecisions) {
  const std::string json = "vad --history --format json ";
  const auto trace = json_lines(run(json + "--trace " + kNarrow).out);
  for (const auto &[min_silence, min_speech] : {std::pair{300, 100}, {65, 200}}) {
    std::vector<std::pair<int, int>> expected, found;  // in samples
    for (const Json &frame : trace) {
      const int now = frame["frame"].get<int>() * 160;
      ASSERT_DOUBLE_EQ(frame["start"], now / 8000.0);
      if (frame["answer"] == 0) continue;
      if (expected.empty() || now - expected.back().second >= 8 * min_silence)
        expected.push_back({now, now});
      expected.back().second = now + 160;
    }
    std::erase_if(expected, [shortest = 8 * min_speech](const auto &span) {
      return span.second - span.first < shortest;
    });
    const std::string limits = min_silence == 65 ? "--min-silence 65 --min-speech 200 " : "";
    for (const Json &line :
         json_lines(run(json + "--pad-before 0 --pad-after 0 " + limits + kNarrow).out))
      found.push_back({line["start_sample"], line["end_sample"]});
    EXPECT_EQ(found, expected) << limits;
  }
}

TEST_F(Reports, QueriesAnswerForEveryWholeBlock) {
  for (const std::string &file : {kWideOpen, kNarrow})
    for (const std::string query : {"energy", "spectrum"}) {
      SCOPED_TRACE(query + " " + file);
      const bool energy = query == "energy";
      const int rate_hz = file == kNarrow ? 8000 : 16000, block = rate_hz / (energy ? 50 : 100);
      std::vector<std::int32_t> values(energy ? 1 : file == kNarrow ? 64 : 128);
      const Pcm pcm = load_recording(file);
      const auto lines = json_lines(run(query + " --format json " + file).out);
      ASSERT_EQ(lines.size(), pcm.size() / static_cast<std::size_t>(block)) << "no part of one";
      std::string csv = energy ? "start,energy" : "start";
      for (std::size_t i = 0; !energy && i < values.size(); ++i) csv += fmt::format(",bin{}", i);
      for (std::size_t i = 0; i < lines.size(); ++i) {
        const std::int16_t *samples = &pcm[i * static_cast<std::size_t>(block)];
        if (energy) values = {computeEnergy(samples, block)};
        if (!energy) getSpectrum(samples, values.data(), rate_hz);
        const double start = static_cast<double>(i) / (energy ? 50 : 100);
        csv += fmt::format("\n{:.2f},{}", start, fmt::join(values, ","));
        ASSERT_EQ(lines[i]["start"], start);
        ASSERT_EQ(lines[i][energy ? "energy" : "power"], energy ? Json(values[0]) : Json(values));
      }
      EXPECT_EQ(run(query + " " + file).out, csv + "\n");
    }
}

}  // namespace
}  // namespace orvalis::test
