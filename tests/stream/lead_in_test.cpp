// The lead-in: which stretch of a recording it is made of, and how that is played.
#include "stream/lead_in.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <string>

#include "tests/support/recordings.h"

namespace orvalis::test {
namespace {

constexpr int32_t kFrame = 80;
constexpr int32_t kWindow = 800;

TEST(LeadIn, IsMadeOfTheQuietestStretchWithoutNullAudio) {
  // A letter a frame: 0 null audio, 1 to 9 that amplitude, o the least on an offset, F full scale.
  const std::string loud(10, '9'), quiet(10, '1'), full(10, 'F');
  const struct {
    std::string script;
    std::ptrdiff_t frame;  // the window's first; -1 for none
  } kCases[] = {{"", -1},
                {std::string(9, '1'), -1},
                {quiet, 0},
                {loud + quiet + loud, 10},
                {quiet + loud + quiet, 0},
                {"9111111110" + loud + "5", 11},
                {"1111111110111111111", -1},
                {loud + "5555555555555" + loud, 10},
                {quiet + std::string(10, 'o') + quiet, 10},
                {full + "FFFFFFFFF9" + full, 10},
                {full + full, 0}};
  for (const auto &[script, frame] : kCases) {
    Pcm pcm;
    for (const char kind : script) {
      const int high = kind == 'F' ? 32767 : kind == 'o' ? 20001 : kind - '0';
      const int low = kind == 'F' ? -32768 : kind == 'o' ? 20000 : '0' - kind;
      for (int i = 0; i < kFrame; ++i)
        pcm.push_back(static_cast<std::int16_t>(i % 2 == 0 ? high : low));
    }
    const auto *window =
        quietest_window(pcm.data(), static_cast<int32_t>(std::ssize(script)), kFrame);
    EXPECT_EQ(window == nullptr ? -1 : window - pcm.data(), frame < 0 ? -1 : frame * kFrame)
        << script;
  }
}

TEST(LeadIn, GoesForthAndBack) {
  Pcm window(kWindow), expected, played(kLeadInFrames * kFrame);
  for (std::size_t i = 0; i < window.size(); ++i) window[i] = static_cast<std::int16_t>(i);
  for (int i = 0; i < 6; ++i) {  // 0.6 s
    expected.insert(expected.end(), window.begin(), window.end());
    std::ranges::reverse(window);
  }
  for (int32_t i = 0; i < kLeadInFrames; ++i)
    make_lead_in_frame(window.data(), kFrame, i, &played[static_cast<std::size_t>(i * kFrame)]);
  EXPECT_EQ(played, expected);
}

}  // namespace
}  // namespace orvalis::test
