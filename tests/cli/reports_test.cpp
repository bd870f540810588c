// What the tool reports: utterances and silences in every format, statistics, the traces of both
// detectors, and queries.
#include <fmt/format.h>
#include <fmt/ranges.h>
#include <gtest/gtest.h>

#include <cstdlib>

#include "Voice_Engine/MCRAvad/MCRAvad.h"
#include "jni/orvalis.h"
#include "tests/cli/tool.h"

namespace orvalis::test {
namespace {

using Reports = Tool;

TEST_F(Reports, FormatsHoldTheSameUtterancesAndSilences) {
  const std::string odd = folder_ / "two, \"three\".wav";
  const std::string odd_in_csv = fmt::format("\"{}\"", folder_ / "two, \"\"three\"\".wav");
  fs::copy(kNarrow, odd);
  for (const std::string what : {"utterance", "silence"}) {
    const bool silences = what == "silence";
    const std::string option = silences ? "epd --silences " : "epd ",
                      number = silences ? what : "number";
    std::string table, csv = silences ? "file,silence,start,end,duration\n"
                                      : "file,number,start,end,duration,began,ended,open\n";
    for (const std::string &file : {odd, kWideOpen}) {
      const std::string quoted = fmt::format("'{}'", file);
      const int rate = file == kWideOpen ? 16000 : 8000;
      const auto length = static_cast<int>(read_audio(file).samples.size());
      auto found = epd(quoted);
      if (silences) {
        const auto utterances = std::exchange(found, {});
        int start = 0;
        const auto add = [&](int end) {
          if (end == start) return;
          found.push_back({{"start_sample", start}, {"end_sample", end}});
          found.back().update({{"silence", found.size()}, {"file", file}, {"rate", rate}});
        };
        for (const Json &utterance : utterances) {
          add(utterance["start_sample"]);
          start = utterance["end_sample"];
        }
        add(length);
      }
      ASSERT_FALSE(found.empty());
      std::string labels, rttm, intervals;
      const std::string id = silences ? "other <NA>" : "<NA> speech";
      int count = 0, covered = 0;
      const auto add_interval = [&](int end, const char *text) {
        if (end > covered)
          intervals += fmt::format(
              "        intervals [{}]:\n            xmin = {:.6f}\n            xmax = {:.6f}\n"
              "            text = \"{}\"\n",
              ++count, double(covered) / rate, double(end) / rate, text);
        covered = end;
      };
      table += fmt::format("{}{}\n{:>9}     start       end  duration\n", table.empty() ? "" : "\n",
                           file, what);
      for (std::size_t i = 0; i < found.size(); ++i) {
        Json &one = found[i];
        EXPECT_EQ(one[number], i + 1);
        const int start = one["start_sample"], end = one["end_sample"];
        const double from = double(start) / rate, to = double(end) / rate;
        const double duration = double(end - start) / rate;
        const bool open = !silences && one["open"].get<bool>();
        EXPECT_EQ(open, !silences && file == kWideOpen && i + 1 == found.size());
        one.update({{"start", from}, {"end", to}, {"duration", duration}});
        table += fmt::format("{:9} {:9.3f} {:9.3f} {:9.3f}{}\n", i + 1, from, to, duration,
                             open ? "  open" : "");
        csv += fmt::format("{},{},{:.6f},{:.6f},{:.6f}", file == odd ? odd_in_csv : file, i + 1,
                           from, to, duration);
        if (!silences) {
          const int began = one["began_sample"], ended = one["ended_sample"];
          EXPECT_LT(start, began);
          EXPECT_LT(began, ended);
          one.update({{"began", double(began) / rate}, {"ended", double(ended) / rate}});
          csv +=
              fmt::format(",{:.6f},{:.6f},{:d}", double(began) / rate, double(ended) / rate, open);
        }
        csv += "\n";
        labels += fmt::format("{:.6f}\t{:.6f}\t{} {}\n", from, to, what, i + 1);
        rttm += fmt::format("{} {} 1 {:.3f} {:.3f} <NA> {} <NA> <NA>\n",
                            silences ? "NON-SPEECH" : "SPEAKER",
                            file == odd ? "two,_\"three\"" : "001", from, duration, id);
        add_interval(start, "");
        add_interval(end, silences ? "silence" : "speech");
      }
      add_interval(length, "");
      const std::string text_grid = fmt::format(
          "File type = \"ooTextFile\"\nObject class = \"TextGrid\"\n\nxmin = 0\nxmax = {0:.6f}\n"
          "tiers? <exists>\nsize = 1\nitem []:\n    item [1]:\n        class = \"IntervalTier\"\n"
          "        name = \"orvalis\"\n        xmin = 0\n        xmax = {0:.6f}\n"
          "        intervals: size = {1}\n{2}\n",
          double(length) / rate, count, intervals);
      EXPECT_EQ(json_lines(run(option + "-f json " + quoted).out), found);
      EXPECT_EQ(run(option + "-f labels " + quoted).out, labels);
      EXPECT_EQ(run(option + "-f rttm " + quoted).out, rttm);
      EXPECT_EQ(run(option + "-f textgrid " + quoted).out, text_grid);
    }
    const std::string both = fmt::format("'{}' {}", odd, kWideOpen);
    EXPECT_EQ(run(option + both).out, table);
    EXPECT_EQ(run(option + "-f csv " + both).out, csv);
  }
}

TEST_F(Reports, SilenceAndNoAudioAreNoErrors) {
  const std::string none = wav("none.wav", {}), silence = wav("silence.wav", Pcm(50000), 48000);
  for (const std::string &input : {none, silence, "- <" + none})
    EXPECT_EQ(run("epd " + input).out, "no utterance\n");
  EXPECT_TRUE(epd(none).empty());
  EXPECT_EQ(run("epd --silences " + none).out, "no silence\n");
}

TEST_F(Reports, StatisticsSumUpTheUtterances) {
  // Neighbours at full scale where the tool reads the next chunk, and at the end.
  Pcm clipped(16000, 1);
  for (const int i : {798, 800, 801, 804, 805, 15995, 15997, 15999})
    clipped[static_cast<std::size_t>(i)] = static_cast<short>(i % 2 == 0 ? -32767 : 32767);
  const std::string none = wav("none.wav", {});
  const std::string files =
      kNarrow + " " + kWideOpen + " " + wav("clipped.wav", clipped) + " " + none;
  std::string expected = "   length    speech    share  utterances   clipped  file\n";
  std::vector<int> all_clipped;
  for (const Json &line : epd("-j 2 --stats " + files)) {
    const std::string file = line["file"];
    const auto found = epd(file);
    double speech = 0;
    for (const Json &utterance : found) speech += utterance["duration"].get<double>();
    const double length = line["length"], share = line["share"];
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
}

TEST_F(Reports, FramesAndTraceOfEpdAgreeWithUtterances) {
  const std::string options = "--gain 4 --content-type 2 " + kWide;
  const auto frames = epd("--frames " + options), trace = epd("--trace " + options);
  const auto utterances = epd(options);
  ASSERT_FALSE(utterances.empty());
  ASSERT_EQ(frames.size(), trace.size());
  std::vector<std::size_t> speech;
  for (std::size_t i = 0; i < frames.size(); ++i) {
    EXPECT_EQ(frames[i]["frame"], i);
    EXPECT_DOUBLE_EQ(frames[i]["start"], static_cast<double>(i) / 100);
    for (const char *field : {"frame", "start", "answer"})
      EXPECT_EQ(frames[i][field], trace[i][field]) << i;
    if (frames[i]["answer"] == 1) speech.push_back(i);
  }
  EXPECT_EQ((speech.front() + 1) * 160, utterances.front()["began_sample"]);
  EXPECT_EQ((speech.back() + 1) * 160, utterances.back()["ended_sample"]);
  EXPECT_TRUE(
      run("epd --frames " + kWide)
          .out.starts_with("    frame     start    answer\n        0      0.00         0\n"));
  EXPECT_TRUE(run("epd --frames --format csv " + kWide)
                  .out.starts_with("file,frame,start,answer\n" + kWide + ",0,0.00,0\n"));
  const Pcm pcm = load_recording(kWide);
  for (const Json &line : epd("--trace " + kWide)) {
    const std::int16_t *frame = &pcm[line["frame"].get<std::size_t>() * 160];
    EXPECT_EQ(line["energy"], computeEnergy(frame, 160));
    EXPECT_EQ(line["peak"], std::abs(*std::max_element(frame, frame + 160, [](int a, int b) {
                return std::abs(a) < std::abs(b);
              })));
  }
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
  for (const auto &[command, file] : {std::pair{std::string("energy"), kWideOpen},
                                      {"spectrum", kWideOpen},
                                      {"spectrum", kNarrow}}) {
    SCOPED_TRACE(command + " " + file);
    const bool energy = command == "energy", narrow = file == kNarrow;
    const int rate_hz = narrow ? 8000 : 16000;
    const std::size_t block = energy ? 320 : narrow ? 80 : 160;
    std::vector<std::int32_t> values(energy ? 1 : narrow ? 64 : 128);
    const Pcm pcm = load_recording(file);
    std::string csv = energy ? "start,energy" : "start";
    for (std::size_t i = 0; !energy && i < values.size(); ++i) csv += fmt::format(",bin{}", i);
    std::vector<Json> expected;
    for (std::size_t at = 0; at + block <= pcm.size(); at += block) {  // a remainder is no block
      if (energy) values = {computeEnergy(&pcm[at], 320)};
      if (!energy) getSpectrum(&pcm[at], values.data(), rate_hz);
      const double start = static_cast<double>(at) / rate_hz;
      csv += fmt::format("\n{:.2f},{}", start, fmt::join(values, ","));
      expected.push_back({{"start", start}});
      expected.back().update(energy ? Json{{"energy", values[0]}} : Json{{"power", values}});
    }
    EXPECT_EQ(run(command + " " + file).out, csv + "\n");
    EXPECT_EQ(json_lines(run(command + " --format json " + file).out), expected);
  }
}

}  // namespace
}  // namespace orvalis::test
