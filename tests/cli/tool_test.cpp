// `orvalis epd`: inputs, options and errors.
#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <sstream>
#include <string>
#include <utility>
#include <vector>

#include "tests/cli/tool.h"
#include "tests/support/audio_file.h"
#include "tests/support/recordings.h"

namespace orvalis::test {
namespace {

TEST_F(Tool, TableAndJsonAgree) {
  const std::string files = kWide + " " + kNarrow + " " + kWideOpen;
  std::string expected;
  std::string name;
  bool open = false;
  for (const Json &found : epd(files)) {
    const double rate = found["rate"];
    EXPECT_EQ(rate, found["file"] == kNarrow ? 8000 : 16000);
    for (const std::string moment : {"start", "end", "began", "ended"})
      EXPECT_DOUBLE_EQ(found[moment], found[moment + "_sample"].get<double>() / rate);
    EXPECT_LT(found["start_sample"], found["began_sample"]);
    if (found["file"] != name) {
      if (!name.empty()) expected += "\n";
      expected += name = found["file"];
      expected += "\nutterance     start       end  duration\n";
    }
    std::array<char, 80> row;
    std::snprintf(row.data(), row.size(), "%9d %9.3f %9.3f %9.3f%s\n", found["number"].get<int>(),
                  found["start"].get<double>(), found["end"].get<double>(),
                  found["end"].get<double>() - found["start"].get<double>(),
                  found["open"] ? "  open" : "");
    expected += row.data();
    open = found["open"];
  }
  EXPECT_EQ(name, kWideOpen);
  EXPECT_TRUE(open);
  EXPECT_EQ(run("epd " + files).out, expected);
}

TEST_F(Tool, EveryWayInGivesTheSameUtterances) {
  for (const std::string &path : {kWide, kNarrow}) {
    const auto expected = unnamed(path);
    ASSERT_FALSE(expected.empty());
    const std::string wav = read_file(path);
    const std::string samples = wav.substr(kWavHeader);
    const std::string raw = path == kWide ? "--raw " : "--raw --rate 8000 ";

    EXPECT_EQ(unnamed("-", wav), expected);
    EXPECT_EQ(unnamed("- <" + path), expected);
    EXPECT_EQ(unnamed(raw + "--lead-in -", samples), expected);
    EXPECT_EQ(unnamed(raw + write("samples", samples)), expected);

    // A live recorder's header, without a length; and the same audio in two channels.
    const std::string open_end = wav.substr(0, kWavHeader - 4) + "\xff\xff\xff\xff" + samples;
    EXPECT_EQ(unnamed("-", open_end), expected);
    std::string doubled;
    for (std::size_t i = 0; i + 1 < samples.size(); i += 2)
      doubled += samples.substr(i, 2) + samples.substr(i, 2);
    EXPECT_EQ(unnamed(raw + "--lead-in --channels 2 -", doubled), expected);

    // Live samples get no lead-in.
    const auto at_once = unnamed("--no-lead-in " + path);
    EXPECT_EQ(unnamed(raw + "-", samples), at_once);
    EXPECT_GT(at_once[0]["start"], expected[0]["start"]);
  }
}

TEST_F(Tool, OptionsReachTheDetector) {
  const auto plain = epd(kNarrow);
  EXPECT_GT(epd("--hangover 0 " + kNarrow).size(), plain.size());
  EXPECT_LT(epd("--hangover 2000 " + kNarrow).size(), plain.size());

  const auto bare = epd("--pad-before 0 --pad-after 0 " + kNarrow);
  for (const int more : {0, 20}) {
    const auto padded = more == 0 ? plain : epd("--pad-before 170 --pad-after 270 " + kNarrow);
    ASSERT_EQ(padded.size(), bare.size());
    for (std::size_t i = 0; i < bare.size(); ++i) {
      EXPECT_EQ(padded[i]["start_sample"], bare[i]["start_sample"].get<int>() - (150 + more) * 8);
      EXPECT_EQ(padded[i]["end_sample"], bare[i]["end_sample"].get<int>() + (250 + more) * 8);
    }
  }

  EXPECT_LT(epd("--content-type 2 " + kWide)[0]["ended"], epd(kWide)[0]["ended"]);
  EXPECT_EQ(epd("--gain 1 " + kNarrow), plain);

  // Gains of 4 and 0.25 make up for audio that is 4 times too quiet or too loud.
  Pcm quiet, loud;
  for (const short sample : load_recording(kNarrow)) {
    quiet.push_back(static_cast<short>(sample / 32));
    loud.push_back(static_cast<short>(quiet.back() * 4));
  }
  write_audio(folder_ / "quiet.wav", quiet, 8000, 1, SF_FORMAT_WAV | SF_FORMAT_PCM_16);
  write_audio(folder_ / "loud.wav", loud, 8000, 1, SF_FORMAT_WAV | SF_FORMAT_PCM_16);
  const auto as_loud = unnamed(folder_ / "loud.wav");
  const auto as_quiet = unnamed(folder_ / "quiet.wav");
  EXPECT_NE(as_loud, as_quiet);
  EXPECT_EQ(unnamed("--gain 4 " + (folder_ / "quiet.wav")), as_loud);
  EXPECT_EQ(unnamed("--gain 0.25 " + (folder_ / "loud.wav")), as_quiet);
}

TEST_F(Tool, FramesAgreeWithUtterances) {
  for (const std::string &options : {kWide, kNarrow, "--gain 4 --content-type 2 " + kWide}) {
    const auto frames = epd("--frames " + options);
    const auto utterances = epd(options);
    ASSERT_FALSE(utterances.empty());
    const auto is_speech = [](const Json &frame) { return frame["answer"] == 1; };
    const auto first = std::ranges::find_if(frames, is_speech);
    const auto last = std::ranges::find_if(frames.rbegin(), frames.rend(), is_speech);
    ASSERT_NE(first, frames.end());
    EXPECT_EQ((*first)["frame"], first - frames.begin());
    EXPECT_NEAR((*first)["start"].get<double>() + 0.01, utterances.front()["began"], 1e-9);
    EXPECT_NEAR((*last)["start"].get<double>() + 0.01, utterances.back()["ended"], 1e-9);
  }
  const std::string table = run("epd --frames " + kWide).out;
  EXPECT_EQ(table.substr(0, 60), "    frame     start    answer\n        0      0.00         0\n");
}

TEST_F(Tool, LogLinesAreShownOnRequestOnly) {
  const Result logged = run("epd --log " + kWide);
  EXPECT_NE(logged.err.find("/Orvalis: "), std::string::npos);
  EXPECT_EQ(logged.out, run("epd " + kWide).out);
  EXPECT_EQ(run("epd -q --frames " + kWide).err, "");
}

TEST_F(Tool, SilenceAndNoAudioAreNoErrors) {
  write_audio<short>(folder_ / "none.wav", {}, 16000, 1, SF_FORMAT_WAV | SF_FORMAT_PCM_16);
  write_audio(folder_ / "silence.wav", std::vector<short>(50000), 48000, 1,
              SF_FORMAT_WAV | SF_FORMAT_PCM_16);
  for (const std::string &arguments :
       {folder_ / "none.wav", folder_ / "silence.wav", "- <" + (folder_ / "none.wav")}) {
    EXPECT_TRUE(epd(arguments).empty());
    EXPECT_EQ(run("epd " + arguments).out, "no utterance\n");
  }
  EXPECT_EQ(run("epd --silences " + (folder_ / "none.wav")).out, "no silence\n");
}

TEST_F(Tool, StatisticsSumUpTheUtterances) {
  // Neighbours at full scale where the tool reads the next chunk, and at the end.
  Pcm clipped(16000, 1);
  for (const int i : {798, 800, 801, 804, 805, 15995, 15997, 15999})
    clipped[static_cast<std::size_t>(i)] = static_cast<short>(i % 2 == 0 ? -32767 : 32767);
  write_audio(folder_ / "clipped.wav", clipped, 16000, 1, SF_FORMAT_WAV | SF_FORMAT_PCM_16);
  write_audio<short>(folder_ / "none.wav", {}, 16000, 1, SF_FORMAT_WAV | SF_FORMAT_PCM_16);
  const std::string files =
      kNarrow + " " + kWideOpen + " " + (folder_ / "clipped.wav") + " " + (folder_ / "none.wav");
  std::string expected = "   length    speech    share  utterances   clipped  file\n";
  std::vector<int> all_clipped;
  for (const Json &line : epd("-j 2 --stats " + files)) {
    const auto found = epd(line["file"].get<std::string>());
    double speech = 0;
    for (const Json &utterance : found) speech += utterance["duration"].get<double>();
    const double length = line["length"];
    EXPECT_NEAR(line["speech"], speech, 1e-9);
    EXPECT_DOUBLE_EQ(line["share"], length > 0 ? speech / length : 0);
    EXPECT_EQ(line["utterances"], found.size());
    all_clipped.push_back(line["clipped"]);
    std::array<char, 200> row;
    std::snprintf(row.data(), row.size(), "%9.3f %9.3f %7.1f%% %11zu %9d  %s\n", length, speech,
                  100 * line["share"].get<double>(), found.size(), all_clipped.back(),
                  line["file"].get<std::string>().c_str());
    expected += row.data();
  }
  EXPECT_EQ(all_clipped, (std::vector{0, 0, 6, 0}));
  EXPECT_EQ(run("epd -q --stats " + files).out, expected);
  EXPECT_EQ(run("vad -q --stats --format csv " + (folder_ / "none.wav")).out,
            "file,length,speech,share,utterances,clipped\n" + (folder_ / "none.wav") +
                ",0.000000,0.000000,0.000000,0,0\n");
}

TEST_F(Tool, BadFilesAreNamedAndTheOthersProcessed) {
  const std::string wav = read_file(kWide);
  const Pcm samples = load_recording(kWide);
  write_audio(folder_ / "whole.flac", samples, 16000, 1, SF_FORMAT_FLAC | SF_FORMAT_PCM_16);
  write_audio(folder_ / "whole.caf", samples, 16000, 1, SF_FORMAT_CAF | SF_FORMAT_PCM_16);
  const std::string flac = read_file(folder_ / "whole.flac");
  const std::vector<std::string> bad = {folder_ / "missing.wav",
                                        folder_.path(),
                                        write("empty.wav", ""),
                                        write("text.wav", "This is a letter, not audio.\n"),
                                        write("header.wav", wav.substr(0, 30)),
                                        write("cut.wav", wav.substr(0, wav.size() / 2)),
                                        write("cut.flac", flac.substr(0, flac.size() / 2))};
  std::string arguments = kWide;
  for (const std::string &name : bad) arguments += " " + name + " " + kWide;
  const Result result = run("epd -q --format json " + arguments);
  EXPECT_EQ(result.status, 1);

  std::istringstream messages(result.err);
  std::string message;
  for (const std::string &name : bad) {
    ASSERT_TRUE(std::getline(messages, message)) << name;
    EXPECT_EQ(message.find("orvalis: " + name + ": "), 0U) << message;
    EXPECT_GT(message.size(), name.size() + 15) << message;
  }
  EXPECT_FALSE(std::getline(messages, message)) << message;

  // Each good file, and what was found in the halves of two.
  const auto found = json_lines(result.out);
  const auto good = epd(kWide);
  EXPECT_EQ(std::ranges::count(found, good.at(0)), 8);
  EXPECT_EQ(found.back(), good.back());
  for (const std::string &cut : {bad[5], bad[6]})
    EXPECT_TRUE(std::ranges::any_of(found, [&](const Json &one) { return one["file"] == cut; }));

  EXPECT_EQ(run("epd --channel 2 " + kWide).status, 1);
  EXPECT_EQ(run("epd " + write("length.wav", wav.substr(0, 43))).status, 1);
  // On a pipe, a format that needs seeking is an error and not silence, and no search for chunks
  // goes on behind the end.
  for (const std::string &name :
       {folder_ / "whole.caf", folder_ / "length.wav", write("text", "no audio at all"),
        write("name.wav", wav.substr(0, 36) + "LIST")}) {
    ChildProcess piped("cat " + name + " | (ulimit -t 4; " + command("epd -") + ")",
                       folder_.path());
    EXPECT_EQ(piped.finish(), 1) << name;
    EXPECT_EQ(piped.errors().find("orvalis: standard input: "), 0U) << piped.errors();
  }
}

TEST_F(Tool, WrongUsageIsNamedAndEndsWith2) {
  // A command line, and what its message says.
  const std::string time = " is not a time from 0 to 3600 s";
  const std::vector<std::pair<std::string, std::string>> table = {
      {"", "a command is missing\nRun orvalis --help"},
      {"eqd x", "unknown command \"eqd\"; did you mean \"epd\"?\nRun orvalis --help"},
      {"help dnoise", "unknown command \"dnoise\"; did you mean \"denoise\"?"},
      {"epd", "FILE is required\nRun orvalis epd --help"},
      {"epd --hepl", "unknown option \"--hepl\"; did you mean \"--help\"?"},
      {"energy x y", "unexpected argument \"y\""},
      {"epd --format xml x", "--format: \"xml\" is none of table, json, csv"},
      {"epd --gain 2 x", "--gain: \"2\" is none of 0.25, 1, 4"},
      {"epd --hangover -1 x", "--hangover: \"-1\"" + time},
      {"epd --hangover 3601s x", "--hangover: \"3601s\"" + time},
      {"epd --hangover 1m x", "--hangover: \"1m\"" + time},
      {"epd --hangover s x", "--hangover: \"s\"" + time},
      {"epd --hangover nan x", "--hangover: \"nan\"" + time},
      {"epd --pad-after 1.5 x", "--pad-after: \"1.5\"" + time},
      {"epd --channel 0 x", "--channel: \"0\" is not a whole number from 1 to 1024"},
      {"epd --rate 16000 x", "--rate requires --raw"},
      {"epd --raw --rate 0 x", "--rate: \"0\""},
      {"epd --raw --rate fast x", "--rate: \"fast\""},
      {"epd --content-type -1 x", "--content-type: \"-1\""},
      {"epd --frames --hangover 9 x", "excludes"},
      {"epd --lead-in --no-lead-in x", "excludes"},
      {"epd --trace --frames x", "excludes"},
      {"epd --format labels x y", "labels describes one file, but several are given"},
      {"epd --format textgrid x y", "textgrid describes one file"},
      {"epd --frames --format rttm x", "the format rttm holds no frames"},
      {"epd --silences --frames x", "excludes"},
      {"vad --silences --stats x", "excludes"},
      {"vad --stats --format labels x", "the format labels holds no statistics"},
      {"epd --trace --format table x", "holds no trace"},
      {"epd - -", "standard input can be read only once"},
      {"epd --jobs 0 x", "--jobs: \"0\" is not a whole number from 1 to 256"},
      {"epd --jobs 2 --log x", "excludes"},
      {"epd --force x", "--force requires --split"},
      {"epd --split '' x", "--split: the name is empty"},
      {"epd --split d --frames x", "excludes"},
      {"epd --split d a/x.wav b/x.flac", "parts of the same names"},
      {"epd --split d - stdin.wav", "parts of the same names"},
      {"epd --dump d x y", "only one can be dumped"},
      {"vad --trace --format labels x", "holds no trace"},
      {"vad --trace --pad-after 1 x", "excludes"},
      {"vad --exponent 0 x", "--exponent: \"0\" is not a number from 0.01 to 2"},
      {"denoise x", "OUTPUT is required\nRun orvalis denoise --help"},
      {"denoise -o '' x", "--output: the name is empty"},
      {"denoise x y", "OUTPUT: y has no known ending"},
      {"denoise x out.txt", "OUTPUT: out.txt has no known ending"},
      {"denoise x - --format flac", "a stream can be wav or raw"},
      {"denoise a/x.wav b/x.wav d", "both become d/x.wav"},
      {"denoise a/x.mp3 b/x.wav d", "both become d/x.wav"},
      {"denoise --format mp4 x y.wav", "--format: \"mp4\" is none of wav"},
      {"denoise --level 18dB x y.wav", "--level: \"18dB\" is none of 13, 18"},
      {"denoise --mics 3 x y.wav", "--mics: \"3\""},
      {"denoise --mics 2 --mix x y.wav", "excludes"},
      {"denoise --mics 2 --channel 1 x y.wav", "excludes"},
      {"denoise --mics 2 --level 18 x y.wav", "excludes"},
      {"denoise --mix --channel 1 x y.wav", "excludes"},
      {"level --mics 2 x y.wav", "unknown option \"--mics\""},
      {"process --report xml x y.wav", "--report: \"xml\""},
      {"process --no-align x y.wav", "unknown option \"--no-align\""}};
  for (const auto &[arguments, says] : table) {
    ChildProcess child("cd " + folder_.path().string() + "; mkdir -p a b; " + command(arguments),
                       folder_.path());
    EXPECT_EQ(child.finish(), 2) << arguments;
    EXPECT_EQ(child.output(), "") << arguments;
    EXPECT_EQ(child.errors().find("orvalis: "), 0U) << child.errors();
    EXPECT_NE(child.errors().find(says), std::string::npos) << child.errors();
  }
  EXPECT_FALSE(std::filesystem::exists(folder_ / "d"))
      << "wrong usage is reported before anything is created";
}

TEST_F(Tool, HelpNamesEveryCommandsOptions) {
  const Result help = run("epd --help");
  EXPECT_EQ(help.status, 0);
  EXPECT_EQ(run("help epd").out, help.out);
  EXPECT_EQ(run("help").out, run("--help").out);
  for (const char *word : {"-f,--format", "--hangover TIME=500ms", "arecord", "help input"})
    EXPECT_NE(help.out.find(word), std::string::npos) << word;
  EXPECT_EQ(help.out.find("Excludes:"), std::string::npos);
  for (const char *standard : {"--min-speech TIME=100ms", "--min-silence TIME=300ms"})
    EXPECT_NE(run("help vad").out.find(standard), std::string::npos) << standard;
  EXPECT_NE(run("help input").out.find("Exit status:"), std::string::npos);
  EXPECT_NE(run("version").out.find("library 160705\n"), std::string::npos);
}

TEST_F(Tool, TimesAndShortOptionsMeanTheSame) {
  const auto expected = epd("--hangover 200 --pad-after 1000 " + kNarrow);
  EXPECT_EQ(epd("--hangover 200ms --pad-after 1s " + kNarrow), expected);
  EXPECT_EQ(run("epd -f json -j 2 --hangover 0.2s --pad-after 1000.0 " + kNarrow).out,
            run("epd --format json --hangover 200 --pad-after 1000 " + kNarrow).out);

  const Result loud = run("denoise " + kNarrow + " " + (folder_ / "last.wav"));
  const Result quiet = run("denoise -q -o " + (folder_ / "by_o.wav") + " " + kNarrow);
  EXPECT_NE(loud.err, "");
  EXPECT_EQ(quiet.err, "");
  EXPECT_EQ(read_file(folder_ / "by_o.wav"), read_file(folder_ / "last.wav"));
  EXPECT_NE(run("epd -q missing.wav").err, "");
}

TEST_F(Tool, LiveAudioIsReportedBeforeItEnds) {
  const std::string samples = read_file(kNarrow).substr(kWavHeader);
  ChildProcess child(command("epd --raw --rate 8000 -"), folder_.path());
  // The first utterance is over after 2.5 s, the second begins after 3.3 s.
  child.write(samples.substr(0, 2 * 8000 * 33 / 10));
  EXPECT_TRUE(child.prints("\n        1 "));
  EXPECT_EQ(child.output().find("\n        2 "), std::string::npos);
  child.write(samples.substr(2 * 8000 * 33 / 10));
  EXPECT_EQ(child.finish(), 0);
  EXPECT_EQ(child.output(), run("epd --no-lead-in " + kNarrow).out);
}

TEST_F(Tool, OutputThatFailsEndsWith1) {
  // More output than a pipe holds, so that the reader has certainly gone before the end.
  const std::string status_file = folder_ / "status";
  ChildProcess child("{ " + command("epd --frames --format json " + kNarrow) + "; echo $? >" +
                         status_file + "; } | true",
                     folder_.path());
  child.finish();
  EXPECT_EQ(read_file(status_file), "1\n");
  EXPECT_EQ(child.errors(), "");

  const Result full = run("epd " + kWide + " >/dev/full");
  EXPECT_EQ(full.status, 1);
  EXPECT_EQ(full.err, "orvalis: standard output: No space left on device\n");
  EXPECT_EQ(run("epd " + kWide + " >&-").status, 1);
  EXPECT_EQ(run("epd missing 2>&-").status, 1);
}

}  // namespace
}  // namespace orvalis::test
