// The outputs of `orvalis denoise`, `level` and `process`: formats, streams, and what is never
// lost.
#include <gmock/gmock.h>
#include <sys/stat.h>

#include <csignal>

#include "tests/cli/tool.h"

namespace orvalis::test {
namespace {

using Outputs = Tool;
using testing::HasSubstr;

TEST_F(Outputs, FormatFollowsNameOrOption) {
  const struct {
    const char *name, *options;
    int format;
  } kCases[] = {{"a.wav", "", kWav16},
                {"a.FLAC", "", SF_FORMAT_FLAC | SF_FORMAT_PCM_16},
                {"a.aif", "", SF_FORMAT_AIFF | SF_FORMAT_PCM_16},
                {"a.au", "", SF_FORMAT_AU | SF_FORMAT_PCM_16},
                {"a.caf", "", SF_FORMAT_CAF | SF_FORMAT_PCM_16},
                {"a.ogg", "", SF_FORMAT_OGG | SF_FORMAT_VORBIS},
                {"a.opus", "", SF_FORMAT_OGG | SF_FORMAT_OPUS},
                {"b.wav", "--format au ", SF_FORMAT_AU | SF_FORMAT_PCM_16}};
  const Pcm expected = enhanced(kLevel, load_recording(kWide));
  for (const auto &[name, options, format] : kCases) {
    const std::string file = folder_ / name;
    EXPECT_EQ(run("level " + std::string(options) + kWide + " " + file).status, 0) << name;
    EXPECT_EQ(read_audio(file).info.format, format) << name;
    if ((format & SF_FORMAT_SUBMASK) == SF_FORMAT_PCM_16) {
      EXPECT_EQ(samples_in(file), expected) << name;
    }
    EXPECT_EQ(read_audio(file).samples.size(), expected.size()) << name;
  }
  // In a folder, outputs have the names of their inputs, with the ending of their format.
  const std::string out = folder_ / "out";
  fs::create_directory(out);
  const std::string raw = write("r.raw", bytes_of(Pcm(1000, 99))), odd = write("x.s16", "1234");
  EXPECT_EQ(run("level --raw " + raw + " " + odd + " - " + out, "12").status, 0);
  EXPECT_EQ(samples_of(read_file(out + "/r.raw")), enhanced(kLevel, Pcm(1000, 99)));
  EXPECT_EQ(run("level --format flac " + kWide + " " + kWideOpen + " " + out).status, 0);
  EXPECT_EQ(names_in(out), (Names{"001.flac", "005.flac", "r.raw", "stdin.wav", "x.wav"}));
}

TEST_F(Outputs, StreamsBeginBeforeTheInputEnds) {
  const Pcm speech = load_recording(kWide);
  ChildProcess child(command("denoise --raw - -"), folder_.path());
  child.write(bytes_of(speech).substr(0, 16000));
  EXPECT_TRUE(child.prints(std::string("WAVEfmt ")));
  // All but an incomplete frame and the delay.
  for (int tries = 0; tries < 1000 && child.output().size() < 16000 - 2 * 208; ++tries)
    std::this_thread::sleep_for(std::chrono::milliseconds(10));
  EXPECT_GE(child.output().size(), 16000u - 2 * 208);
  child.write(bytes_of(speech).substr(16000));
  EXPECT_EQ(child.finish(), 0);

  EXPECT_EQ(samples_of(child.output().substr(kWavHeader)), enhanced(kDenoise, speech));
  const std::string streamed = write("streamed.wav", child.output());
  EXPECT_EQ(unnamed("- <" + streamed),
            unnamed("--raw " + write("raw", child.output().substr(kWavHeader))));
}

TEST_F(Outputs, NoFileIsLost) {
  const std::string bytes = read_file(kWide), take = write("take.wav", bytes);
  const std::string folder = folder_.path(), soft = folder_ / "soft.wav";
  fs::create_symlink(take, soft);
  fs::create_hard_link(take, folder_ / "hard.wav");
  for (const std::string &arguments :
       {"denoise --force " + take + " " + take,
        "level --force " + take + " " + folder + "/./take.wav",
        "process --force " + take + " " + soft, "denoise --force " + soft + " " + take,
        "denoise --force " + take + " " + (folder_ / "hard.wav"),
        "level --force - " + take + " <" + take, "denoise --force " + take + " - >>" + take,
        "process --force " + take + " " + folder}) {
    const Result refused = run(arguments);
    EXPECT_EQ(refused.status, 1) << arguments;
    EXPECT_THAT(refused.err, HasSubstr(": the file is an input\n"));
    EXPECT_EQ(read_file(take), bytes) << arguments;
  }
  // Nor by the output of another input, nor by an utterance's file.
  fs::create_directory(folder_ / "other");
  const std::string other = write("other/take.wav", bytes);
  fs::create_symlink(other, folder_ / "alias.wav");
  const Result one_done =
      run("level --force " + take + " " + (folder_ / "alias.wav") + " " + (folder_ / "other"));
  EXPECT_EQ(one_done.err.find("orvalis: " + take + ": " + other + ": the file is an input\n"), 0u);
  EXPECT_TRUE(fs::exists(folder_ / "other/alias.wav"));
  EXPECT_EQ(read_file(other), bytes);
  const std::string part = write("take-001.wav", bytes);
  EXPECT_EQ(run("epd --force --split " + folder + " " + part + " " + take).status, 1);
  EXPECT_EQ(read_file(part), bytes);

  const std::string letter = write("letter.wav", "a letter");
  EXPECT_EQ(run("denoise " + take + " " + letter).err,
            "orvalis: " + take + ": " + letter + ": the file exists; --force replaces it\n");
  EXPECT_EQ(read_file(letter), "a letter");
  fs::permissions(letter, fs::perms::owner_read);
  EXPECT_EQ(run("denoise --force --sync " + take + " " + letter).status, 0);
  EXPECT_EQ(read_audio(letter).info.samplerate, 16000);
  EXPECT_EQ(fs::status(letter).permissions(), fs::perms::owner_read);
}

TEST_F(Outputs, OfOneRunAreFilesOfTheirOwn) {
  const std::string bytes = read_file(kWide), take = write("take.wav", bytes);
  const std::string in_part = write("take-001.wav", bytes), folder = folder_.path();
  const std::string new_folder = folder_ / "new", link = folder_ / "link";
  fs::create_directory(folder_ / "old");
  fs::create_directory_symlink("old", link);
  fs::create_hard_link(write("old/take.wav", "one file"), folder_ / "old/take-001.wav");
  for (const std::string &arguments :
       {"--split " + new_folder + " " + take + " " + new_folder + "/take-001.wav",
        "--split " + new_folder + " " + take + " " + in_part + " " + new_folder,
        "--split " + link + " " + take + " " + (folder_ / "old/take-1000.wav"),
        take + " " + in_part + " " + (folder_ / "old")}) {
    EXPECT_EQ(run("process --force " + arguments).status, 2) << arguments;
    EXPECT_FALSE(fs::exists(new_folder)) << "before the work begins";
  }
  // The longest name that there is, in folders that are created.
  const std::string longest(251, 'x');
  EXPECT_EQ(run("denoise " + take + " " + in_part + " " + new_folder + "/a").status, 0);
  EXPECT_EQ(run("denoise " + take + " " + new_folder + "/b/").status, 0);
  EXPECT_EQ(run("denoise " + take + " " + new_folder + "/b/" + longest + ".wav").status, 0);
  EXPECT_EQ(names_in(new_folder + "/a"), (Names{"take-001.wav", "take.wav"}));
  EXPECT_EQ(names_in(new_folder + "/b"), (Names{"take.wav", longest + ".wav"}));
}

TEST_F(Outputs, InterruptedWorkLeavesNothing) {
  const std::string out = folder_ / "out", fifo = folder_ / "fifo";
  fs::create_directory(out);
  ASSERT_EQ(mkfifo(fifo.c_str(), 0600), 0);
  write("out/.orvalis-letter.part", "not ours");
  for (const std::string signal : {"INT", "TERM", "HUP", "KILL"}) {
    // A shell lets what it starts in the background ignore INT.
    const Result result =
        shell("{ cat " + kWide + "; sleep 1; } >" + fifo + " & env --default-signal=INT " +
              command("denoise " + fifo + " " + out + "/a.wav") + " & sleep 0.4; ls -A " + out +
              " | wc -l; kill -" + signal + " $!; wait $!; kill -l $?; wait");
    EXPECT_EQ(result.out, "2\n" + signal + "\n") << result.err;
    EXPECT_EQ(names_in(out).size(), signal == "KILL" ? 2u : 1u) << signal;
  }
  EXPECT_EQ(run("denoise " + kWide + " " + out + "/b.wav").status, 0);
  EXPECT_EQ(names_in(out), (Names{".orvalis-letter.part", "b.wav"}));
}

TEST_F(Outputs, CtrlCOfLiveAudioEndsTheRecorderOnly) {
  // Within the second utterance.
  const std::string samples = bytes_of(load_recording(kNarrow)).substr(0, 2 * 8000 * 5);
  const std::string epd = "epd --raw --rate 8000 -";
  ChildProcess live(
      "exec 3<&0; env --default-signal=INT " + command(epd) + " <&3 & echo $! >&2; wait $!",
      folder_.path());
  live.write(samples);
  EXPECT_TRUE(live.prints("\n        1 "));
  kill(std::stoi(live.errors()), SIGINT);
  std::this_thread::sleep_for(std::chrono::milliseconds(100));
  EXPECT_EQ(live.finish(), 0);
  const std::string reported = live.output();
  EXPECT_THAT(reported, HasSubstr("  open\n"));
  EXPECT_EQ(reported, run(epd, samples).out);
}

TEST_F(Outputs, NothingHalfWrittenIsLeft) {
  const std::string out = folder_ / "out/",
                    cut = write("cut.wav", read_file(kWide).substr(0, 20000));
  fs::create_directory(out);
  for (const std::string name : {"a.wav", "a.raw", "a.flac"}) {
    const Result large = shell("ulimit -f 8; " + command("process " + kWide + " " + out + name));
    EXPECT_EQ(large.status, 1);
    EXPECT_THAT(large.err, HasSubstr(": " + out + name + ": File too large\n"));
  }
  EXPECT_EQ(run("denoise " + cut + " " + out + "a.wav").status, 1) << "half an input";
  EXPECT_EQ(run("denoise " + kWide + " " + out + "missing/a.wav").status, 1);
  EXPECT_EQ(run("level --force " + kWide + " /dev/full").err,
            "orvalis: " + kWide + ": /dev/full: No space left on device\n");
  // libsndfile writes these without a header if there is no sample.
  for (const std::string name : {"empty.flac", "empty.ogg", "empty.opus"})
    EXPECT_EQ(run("level --raw - " + out + name, "x").err,
              "orvalis: standard input: " + out + name +
                  ": the format cannot hold audio without a sample\n");
  EXPECT_TRUE(fs::is_empty(out));

  // If standard error is closed, notes must not end up in the output.
  const std::string noted = "level --raw --rate 8000 - " + out;
  EXPECT_NE(run(noted + "a.raw", "some samples").err, "");
  EXPECT_EQ(run(noted + "b.raw 2>&-", "some samples").status, 0);
  EXPECT_EQ(read_file(out + "a.raw"), read_file(out + "b.raw"));
}

}  // namespace
}  // namespace orvalis::test
