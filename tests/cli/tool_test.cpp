// The command line: inputs, options, help and errors.
#include <gtest/gtest.h>

#include "cli/commands.h"
#include "cli/usage.h"
#include "tests/cli/tool.h"

namespace orvalis::test {
namespace {

TEST_F(Tool, EveryWayInGivesTheSameUtterances) {
  for (const std::string &path : {kWide, kNarrow}) {
    const auto expected = unnamed(path);
    ASSERT_FALSE(expected.empty());
    const std::string wav = read_file(path), samples = wav.substr(kWavHeader);
    const std::string raw = path == kWide ? "--raw " : "--raw --rate 8000 ";
    EXPECT_EQ(unnamed("-", wav), expected);
    EXPECT_EQ(unnamed("- <" + path), expected);
    EXPECT_EQ(unnamed(raw + "--lead-in -", samples), expected);
    EXPECT_EQ(unnamed(raw + write("samples", samples)), expected);
    // A live recorder's header, without a length; and the same audio in two channels.
    const std::string open_end = wav.substr(0, kWavHeader - 4) + "\xff\xff\xff\xff" + samples;
    EXPECT_EQ(unnamed("-", open_end), expected);
    const Pcm pcm = load_recording(path);
    EXPECT_EQ(unnamed(raw + "--lead-in --channels 2 -", bytes_of(interleaved(pcm, pcm))), expected);
    // Live samples get no lead-in.
    const auto at_once = unnamed("--no-lead-in " + path);
    EXPECT_EQ(unnamed(raw + "-", samples), at_once);
    EXPECT_GT(at_once[0]["start"], expected[0]["start"]);
  }
  const std::string samples = read_file(kNarrow).substr(kWavHeader);
  EXPECT_EQ(run("vad --raw --rate 8000 -", samples).out, run("vad " + kNarrow).out);
}

TEST_F(Tool, OptionsReachTheDetector) {
  const auto plain = epd(kNarrow);
  EXPECT_GT(epd("--hangover 0 " + kNarrow).size(), plain.size());
  const auto longer = epd("--hangover 2000 " + kNarrow);
  EXPECT_LT(longer.size(), plain.size());
  for (const std::string time : {"2000.0", "2000ms", "2s"})
    EXPECT_EQ(epd("-j 2 --hangover " + time + " " + kNarrow), longer) << time;

  const auto bare = epd("--pad-before 0 --pad-after 0 " + kNarrow);
  const auto padded = epd("--pad-before 170 --pad-after 0.27s " + kNarrow);
  ASSERT_EQ(plain.size(), bare.size());
  ASSERT_EQ(padded.size(), bare.size());
  for (std::size_t i = 0; i < bare.size(); ++i) {
    const int start = bare[i]["start_sample"], end = bare[i]["end_sample"];
    EXPECT_EQ(plain[i]["start_sample"], start - 150 * 8);
    EXPECT_EQ(plain[i]["end_sample"], end + 250 * 8);
    EXPECT_EQ(padded[i]["start_sample"], start - 170 * 8);
    EXPECT_EQ(padded[i]["end_sample"], end + 270 * 8);
  }
  EXPECT_LT(epd("--content-type 2 " + kWide)[0]["ended"], epd(kWide)[0]["ended"]);
  EXPECT_EQ(epd("--gain 1 " + kNarrow), plain);

  // Gains of 4 and 0.25 make up for audio that is 4 times too quiet or too loud.
  Pcm quiet, loud;
  for (const short sample : load_recording(kNarrow)) {
    quiet.push_back(static_cast<short>(sample / 32));
    loud.push_back(static_cast<short>(quiet.back() * 4));
  }
  const std::string quiet_file = wav("quiet.wav", quiet, 8000);
  const std::string loud_file = wav("loud.wav", loud, 8000);
  const auto as_loud = unnamed(loud_file), as_quiet = unnamed(quiet_file);
  EXPECT_NE(as_loud, as_quiet);
  EXPECT_EQ(unnamed("--gain 4 " + quiet_file), as_loud);
  EXPECT_EQ(unnamed("--gain 0.25 " + loud_file), as_quiet);

  const Result logged = run("epd --log " + kWide);
  EXPECT_NE(logged.err.find("/Orvalis: "), std::string::npos);
  EXPECT_EQ(logged.out, run("epd " + kWide).out);

  const std::string last = folder_ / "last.wav", by_o = folder_ / "by_o.wav";
  EXPECT_NE(run("denoise " + kNarrow + " " + last).err, "");
  EXPECT_EQ(run("denoise -q -o " + by_o + " " + kNarrow).err, "");
  EXPECT_EQ(read_file(by_o), read_file(last));
  EXPECT_NE(run("epd -q missing.wav").err, "");
  // Control characters do not reach the terminal.
  EXPECT_EQ(run("epd 'a\x1b[31m\xc2\x9b.wav'").err.find("orvalis: a\\x1b[31m\\x9b.wav: "), 0u);
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
    const Result piped = shell("cat " + name + " | (ulimit -t 4; " + command("epd -") + ")");
    EXPECT_EQ(piped.status, 1) << name;
    EXPECT_EQ(piped.err.find("orvalis: standard input: "), 0U) << piped.err;
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
      {"epd --hangover nan x", "--hangover: \"nan\"" + time},
      {"epd --pad-after 1.5 x", "--pad-after: \"1.5\"" + time},
      {"epd --channel 0 x", "--channel: \"0\" is not a whole number from 1 to 1024"},
      {"epd --rate 16000 x", "--rate requires --raw"},
      {"epd --raw --rate 0 x", "--rate: \"0\""},
      {"epd --content-type -1 x", "--content-type: \"-1\""},
      {"epd --frames --hangover 9 x", "excludes"},
      {"epd --lead-in --no-lead-in x", "excludes"},
      {"epd --format labels x y", "labels describes one file, but several are given"},
      {"epd --frames --format rttm x", "the format rttm holds no frames"},
      {"vad --silences --trace --pad-after 1 x", "excludes"},
      {"vad --stats --format labels x", "the format labels holds no statistics"},
      {"epd --trace --format table x", "holds no trace"},
      {"epd - -", "standard input can be read only once"},
      {"epd --jobs 0 x", "--jobs: \"0\" is not a whole number from 1 to 256"},
      {"epd --jobs 2 --log x", "excludes"},
      {"epd --force x", "--force requires --split"},
      {"epd --split d a/x.wav b/x.flac", "parts of the same names"},
      {"epd --split d - stdin.wav", "parts of the same names"},
      {"epd --dump d x y", "only one can be dumped"},
      {"vad --exponent 0 x", "--exponent: \"0\" is not a number from 0.01 to 2"},
      {"denoise x", "OUTPUT is required\nRun orvalis denoise --help"},
      {"denoise x y", "OUTPUT: y has no known ending"},
      {"denoise x - --format flac", "a stream can be wav or raw"},
      {"denoise a/x.wav b/x.wav d", "both become d/x.wav"},
      {"denoise --level 18dB x y.wav", "--level: \"18dB\" is none of 13, 18"},
      {"denoise --mics 3 x y.wav", "--mics: \"3\""},
      {"denoise --mics 2 --mix x y.wav", "excludes"},
      {"denoise --mics 2 --channel 1 x y.wav", "excludes"},
      {"denoise --mics 2 --level 18 x y.wav", "excludes"},
      {"denoise --mix --channel 1 x y.wav", "excludes"},
      {"level --mics 2 x y.wav", "unknown option \"--mics\""},
      {"process --report xml x y.wav", "--report: \"xml\""},
  };
  const fs::path before = fs::current_path();
  fs::current_path(folder_.path());
  for (const auto &[arguments, says] : table) {
    cli::Run run;
    CLI::App app("", "orvalis");
    app.require_subcommand(1);
    cli::add_detect_commands(app, run);
    cli::add_enhance_commands(app, run);
    cli::add_query_commands(app, run);
    cli::add_help_command(app, run);
    try {
      app.parse(arguments);
      ADD_FAILURE() << arguments;
    } catch (const CLI::ParseError &error) {
      EXPECT_NE(cli::usage_error(app, error).find("orvalis: "), std::string::npos);
      EXPECT_NE(cli::usage_error(app, error).find(says), std::string::npos)
          << cli::usage_error(app, error);
    }
  }
  fs::current_path(before);
  EXPECT_TRUE(fs::is_empty(folder_.path())) << "wrong usage is reported before anything is created";
  for (const std::string arguments : {"", "epd --split '' x", "denoise -o '' x", "denoise x y"}) {
    const Result result = run(arguments);
    EXPECT_EQ(result.status, 2) << arguments;
    EXPECT_EQ(result.out, "");
    EXPECT_EQ(result.err.find("orvalis: "), 0u) << result.err;
    EXPECT_EQ(result.err.find("the name is empty") != std::string::npos,
              arguments.find("''") != std::string::npos);
  }
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

}  // namespace
}  // namespace orvalis::test
