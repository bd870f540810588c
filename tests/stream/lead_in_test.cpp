// Which stretch of a recording the lead-in is made of.
#include "stream/lead_in.h"

#include <gtest/gtest.h>

#include <string>

#include "tests/support/recordings.h"

namespace orvalis::test {
namespace {

constexpr int32_t kFrame = 80;

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

}  // namespace
}  // namespace orvalis::test
