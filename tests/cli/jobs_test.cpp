// `orvalis epd` on several files at once, and the progress line on a terminal.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <poll.h>
#include <unistd.h>

#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <string>
#include <thread>

#include "tests/cli/tool.h"

namespace orvalis::test {
namespace {

using Jobs = Tool;

TEST_F(Jobs, OrderIsThatOfTheFiles) {
  // The long ones first, so that the others have to wait for them.
  const std::string files = kNarrow + " missing.wav - " + kWide + " " + write("empty.wav", "") +
                            " " + kNarrow + " " + kWideOpen + " 2>&1";
  const std::string input = read_file(kWide);
  for (const std::string options : {"", "--frames ", "--format json ", "--format csv "}) {
    const Result one = run("epd " + options + files, input);
    EXPECT_EQ(one.status, 1);
    for (const std::string jobs : {"1", "2", "4", "99"}) {
      const Result several = run("epd --jobs " + jobs + " " + options + files, input);
      EXPECT_EQ(several.status, 1);
      EXPECT_EQ(several.out, one.out) << jobs << options;
    }
  }
}

TEST_F(Jobs, TheCurrentJobPrintsLive) {
  const std::string samples = read_file(kNarrow).substr(kWavHeader);
  const std::string files = " " + kWide + " - " + kWideOpen;
  ChildProcess child(command("epd --jobs 3 --raw --rate 8000" + files), folder_.path());
  child.write(samples.substr(0, 2 * 8000 * 33 / 10));
  EXPECT_TRUE(child.prints("\n-\nutterance     start       end  duration\n        1 "));
  EXPECT_EQ(child.output().find(kWideOpen), std::string::npos);
  EXPECT_EQ(child.finish(), 0);
  EXPECT_NE(child.output().find("\n" + kWideOpen + "\n"), std::string::npos);
}

TEST_F(Jobs, OutputThatFailsEndsThemAll) {
  const std::string files = kNarrow + " " + kWide + " " + kNarrow + " >/dev/full";
  const Result full = run("epd --jobs 3 " + files);
  EXPECT_EQ(full.status, 1);
  EXPECT_EQ(full.err, "orvalis: standard output: No space left on device\n");
}

/// A terminal without a keyboard.
class Terminal {
public:
  Terminal() : screen_(posix_openpt(O_RDWR | O_NOCTTY)) {
    if (grantpt(screen_) != 0 || unlockpt(screen_) != 0) return;
    name_ = ptsname(screen_);
    line_ = open(name_.c_str(), O_RDWR | O_NOCTTY);  // keeps what is shown until it is read
  }
  ~Terminal() {
    close(line_);
    close(screen_);
  }
  Terminal(const Terminal &) = delete;
  Terminal &operator=(const Terminal &) = delete;

  /// Whether this system has terminals: a bare root folder lacks /dev/pts.
  bool exists() const { return line_ >= 0; }

  const std::string &name() const { return name_; }

  /// What was shown since the last call, including what arrives within 0.3 s.
  std::string shown() const {
    std::string text;
    char chunk[4096];
    for (pollfd screen{screen_, POLLIN, 0}; poll(&screen, 1, 300) > 0;) {
      const ssize_t got = read(screen_, chunk, sizeof chunk);
      if (got <= 0) break;
      text.append(chunk, static_cast<std::size_t>(got));
    }
    return text;
  }

private:
  int screen_, line_ = -1;
  std::string name_;
};

TEST_F(Jobs, LongWorkIsShownOnATerminalAndWiped) {
  const Terminal terminal;
  if (!terminal.exists()) GTEST_SKIP() << "the system has no terminals";
  // A slow reader makes the work long.
  const std::string slow = " | { sleep 1.2; cat; }";
  const std::string frames = "epd --frames " + kNarrow;
  for (const std::string &work : {frames, "denoise --keep-rate " + kNarrow + " -"}) {
    ChildProcess shown(command(work) + " 2>" + terminal.name() + slow, folder_.path());
    EXPECT_EQ(shown.finish(), 0);
    const std::string seen = terminal.shown();
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

  ChildProcess unseen(command(frames) + slow, folder_.path());
  EXPECT_EQ(unseen.finish(), 0);
  EXPECT_EQ(unseen.errors().find("real time"), std::string::npos);
  run("epd " + kWide + " 2>" + terminal.name());
  EXPECT_EQ(terminal.shown().find("real time"), std::string::npos) << "short work needs no line";

  // The line is cleared before anything is printed on the same terminal.
  ChildProcess live(command("epd --raw --rate 8000 - >") + terminal.name() + " 2>&1",
                    folder_.path());
  const std::string samples = read_file(kNarrow).substr(kWavHeader);
  live.write(samples.substr(0, 16000));
  std::this_thread::sleep_for(std::chrono::milliseconds(1200));
  live.write(samples.substr(16000, 2 * 8000 * 23 / 10));
  EXPECT_EQ(live.finish(), 0);
  const std::string mixed = terminal.shown();
  EXPECT_NE(mixed.find("  standard input\r\x1b[Kutterance     start"), std::string::npos) << mixed;
}

}  // namespace
}  // namespace orvalis::test
