// Several files at once, live audio, standard output that fails, and the progress line.
#include <gmock/gmock.h>

#include <cstdio>

#include "tests/cli/tool.h"

namespace orvalis::test {
namespace {

using Jobs = Tool;

TEST_F(Jobs, OrderIsThatOfTheFiles) {
  // The long ones first, so that the others have to wait for them.
  const std::string files = kNarrow + " missing.wav - " + kWide + " " + write("empty.wav", "") +
                            " " + kWideOpen + " 2>&1";
  const std::string input = read_file(kWide);
  for (const std::string options : {"epd ", "epd --frames ", "vad --format csv "}) {
    const Result one = run(options + files, input), several = run(options + "-j 4 " + files, input);
    EXPECT_EQ(one.status, 1);
    EXPECT_EQ(several.status, 1);
    EXPECT_EQ(several.out, one.out) << options;
    for (const char *failed : {"missing.wav: No such file", "empty.wav: the input is empty"})
      EXPECT_THAT(one.out, testing::HasSubstr(failed));
  }
}

TEST_F(Jobs, LiveAudioIsReportedBeforeItEnds) {
  const std::string samples = read_file(kNarrow).substr(kWavHeader);
  // The first utterance is over after 2.5 s, the second begins after 3.3 s.
  const std::size_t pause = 2 * 8000 * 33 / 10;
  ChildProcess child(command("epd -j 3 --raw --rate 8000 " + kWide + " - " + kWideOpen),
                     folder_.path());
  child.write(samples.substr(0, pause));
  EXPECT_TRUE(child.prints("\n-\nutterance     start       end  duration\n        1 "));
  EXPECT_EQ(child.output().find(kWideOpen), std::string::npos);
  child.write(samples.substr(pause));
  EXPECT_EQ(child.finish(), 0);
  const std::string all = child.output();
  const std::string live = run("epd --raw --rate 8000 -", samples).out;
  EXPECT_EQ(live, run("epd --no-lead-in " + kNarrow).out);
  EXPECT_THAT(all, testing::HasSubstr("\n-\n" + live + "\n" + kWideOpen + "\n"));
}

TEST_F(Jobs, StandardOutputThatFailsEndsThemAllWith1) {
  const std::string files = kNarrow + " " + kWide + " " + kNarrow;
  const std::string full = "orvalis: standard output: No space left on device\n";
  for (const std::string &work : {"epd --jobs 3 " + files, "denoise " + kWide + " -"}) {
    const Result result = run(work + " >/dev/full");
    EXPECT_EQ(result.status, 1) << work;
    EXPECT_EQ(result.err, full);
    EXPECT_EQ(run(work + " >&-").status, 1) << work;
    // More output than a pipe holds, so that the reader has certainly gone before the end.
    const std::string much = work.starts_with("epd") ? work + " --frames --format json" : work;
    const Result gone = shell("{ " + command(much) + "; echo $? >&2; } | true");
    EXPECT_EQ(gone.err, "1\n") << work;
  }
  EXPECT_EQ(run("epd missing 2>&-").status, 1);
}

TEST_F(Jobs, LongWorkIsShownOnATerminalAndWiped) {
  // Both outputs go to a terminal, unless told otherwise.
  const auto shown = [this](const std::string &line) {
    return shell("script -qec \"" + line + "\" /dev/null").out;
  };
  if (shell("script -qec true /dev/null").status != 0)
    GTEST_SKIP() << "the system has no terminals";
  EXPECT_THAT(shown(command("denoise " + kWide + " -")),
              testing::HasSubstr("audio does not go to a terminal"));

  // A slow reader makes the work long.
  const std::string slow = " | { sleep 1.2; cat; } >/dev/null", frames = "epd --frames " + kNarrow;
  for (const std::string &work : {frames, "denoise --keep-rate " + kNarrow + " -"}) {
    const std::string seen = shown(command(work) + slow);
    int percent = 0, seconds = 0, length = 0;
    double speed = 0;
    EXPECT_EQ(std::sscanf(seen.c_str(), "\r\x1b[K %d %%  0:00:%d  %lf x real time  all.wav%n",
                          &percent, &seconds, &speed, &length),
              3)
        << seen;
    EXPECT_GT(length, 0) << seen;
    EXPECT_NEAR(percent, seconds / 57.114 * 100, 2.5);
    EXPECT_GT(speed, 0);
    EXPECT_TRUE(seen.ends_with("all.wav\r\x1b[K")) << seen;
  }
  EXPECT_EQ(shown(command("epd -q --frames " + kNarrow) + slow), "");
  EXPECT_EQ(shell(command(frames) + slow).err, "");
  EXPECT_EQ(shown(command("epd " + kWide) + " >/dev/null"), "") << "short work needs no line";

  // The line is cleared before anything is printed on the same terminal.
  const std::string samples = write("samples", read_file(kNarrow).substr(kWavHeader));
  const std::string mixed = shown("{ head -c 16000 " + samples + "; sleep 1.2; tail -c +16001 " +
                                  samples + "; } | " + command("epd --raw --rate 8000 -"));
  EXPECT_THAT(mixed, testing::HasSubstr("  standard input\r\x1b[Kutterance     start"));
}

}  // namespace
}  // namespace orvalis::test
