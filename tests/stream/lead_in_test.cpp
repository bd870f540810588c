// The lead-in: which stretch of a recording it is made of, and how that is played.
#include "stream/lead_in.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <random>
#include <vector>

#include "tests/support/random.h"
#include "tests/support/recordings.h"

namespace orvalis::test {
namespace {

constexpr int32_t kFrame = 80;
constexpr int32_t kWindow = 800;

/// The same by its definition. The variance times the square of the length is less than 2^50, which
/// a double holds exactly.
std::ptrdiff_t expected_window(const Pcm &pcm) {
  std::ptrdiff_t best = -1;
  double least = 0;
  for (std::ptrdiff_t start = 0; start + kWindow <= std::ssize(pcm); start += kFrame) {
    double sum = 0, squares = 0;
    int zeros = 0;
    bool is_null = false;
    for (std::ptrdiff_t i = 0; i < kWindow; ++i) {
      const std::int16_t sample = pcm[static_cast<std::size_t>(start + i)];
      sum += sample;
      squares += double(sample) * sample;
      zeros = i % kFrame == 0 ? sample == 0 : sample == 0 ? zeros + 1 : 0;
      is_null = is_null || zeros > 60;
    }
    const double variance = kWindow * squares - sum * sum;
    if (is_null || (best >= 0 && variance >= least)) continue;
    best = start;
    least = variance;
  }
  return best;
}

TEST(LeadIn, IsMadeOfTheQuietestStretchWithoutNullAudio) {
  auto generator = seeded_generator();
  const auto up_to = [&](int most) {
    return std::uniform_int_distribution<int>(0, most)(generator);
  };
  int found = 0;
  for (int round = 0; round < 500; ++round) {
    Pcm pcm;
    while (up_to(12) > 0) {  // stretches of one level, so that windows often tie
      const int level = 1 << up_to(15), offset = up_to(2) - 1;
      const bool is_loudest = up_to(3) == 0;
      const auto length = static_cast<std::size_t>(kFrame / 2 * up_to(40));
      for (std::size_t i = 0; i < length; ++i) {
        const int value = is_loudest ? (i % 2 == 0 ? 32767 : -32768)
                                     : offset * (level - 1) + (i % 2 == 0 ? up_to(level) : 0) / 2;
        pcm.push_back(static_cast<std::int16_t>(std::clamp(value, -32768, 32767)));
      }
      if (up_to(3) == 0) pcm.resize(pcm.size() + static_cast<std::size_t>(up_to(200)));
    }
    const std::int16_t *window =
        quietest_window(pcm.data(), static_cast<int32_t>(pcm.size()) / kFrame, kFrame);
    ASSERT_EQ(window == nullptr ? -1 : window - pcm.data(), expected_window(pcm)) << round;
    found += window != nullptr;
  }
  EXPECT_GT(found, 100);
  EXPECT_LT(found, 500);
}

TEST(LeadIn, GoesForthAndBack) {
  Pcm window(kWindow), expected, played;
  for (std::size_t i = 0; i < window.size(); ++i) window[i] = static_cast<std::int16_t>(i);
  for (int i = 0; i < kLeadInFrames / kLeadInWindow; ++i) {
    expected.insert(expected.end(), window.begin(), window.end());
    std::ranges::reverse(window);
  }
  for (int32_t i = 0; i < kLeadInFrames; ++i) {
    std::int16_t frame[kFrame];
    make_lead_in_frame(window.data(), kFrame, i, frame);
    played.insert(played.end(), frame, frame + kFrame);
  }
  EXPECT_EQ(played, expected);
  EXPECT_EQ(played.size(), 4800U) << "0.6 s";
}

}  // namespace
}  // namespace orvalis::test
