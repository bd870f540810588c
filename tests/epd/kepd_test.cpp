// The end-point decision over runs of voiced and unvoiced frames.
#include <gtest/gtest.h>

#include <algorithm>
#include <sstream>
#include <string>

#include "Voice_Engine/epd/kepd.h"
#include "tests/support/quiet_log.h"

namespace orvalis::test {
namespace {

/// The decisions on frames with or without voice, both as runs like "45n 26s 1e": voiced or
/// unvoiced frames in, none, speech or end of speech out.
std::string decisions(const std::string &runs, std::uint32_t type, bool narrow_band) {
  const QuietLog quiet;
  KepdState kepd{};
  EpdReasons reasons{};
  std::istringstream in(runs);
  std::string given;
  int frames = 0;
  for (char kind = 0; in >> frames >> kind;)
    for (; frames > 0; --frames)
      given += "nse"[decide(kepd, kind == 'v', type, narrow_band, reasons)];
  std::string folded;
  for (std::size_t at = 0, end = 0; at < given.size(); at = end) {
    end = std::min(given.find_first_not_of(given[at], at), given.size());
    folded += (at == 0 ? "" : " ") + std::to_string(end - at) + given[at];
  }
  return folded;
}

TEST(Kepd, AnswersRunsOfVoiceAndPause) {
  const struct {
    std::uint32_t type;
    const char *runs, *wide, *narrow;
  } cases[] = {
      {0, "300u", "300n", "300n"},
      {1, "100v 40u", "44n 80s 1e 15n", "44n 83s 1e 12n"},  // after the initial noise frames
      {0, "39u 5v 1u 6v 10u", "50n 11s", "50n 11s"},
      {0, "50v 20u 3v 5u", "44n 33s 1e", "44n 34s"},  // four voiced in a row clear the pause
      {0, "50v 20u 4v 24u 4u", "44n 54s 1e 3n", "44n 57s 1e"},
      {2, "60v 20u", "42n 31s 1e 6n", "42n 34s 1e 3n"},
      {9, "39u 3v 1u 4v 20u", "46n 14s 7n", "46n 14s 7n"},  // too short, so never ended
      {2, "48v 20u 60v 14u", "42n 19s 10n 70s 1e", "42n 19s 10n 71s"},
  };
  for (const auto &[type, runs, wide, narrow] : cases) {
    EXPECT_EQ(decisions(runs, type, false), wide) << runs;
    EXPECT_EQ(decisions(runs, type, true), narrow) << runs;
  }
}

}  // namespace
}  // namespace orvalis::test
