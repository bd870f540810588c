// The stateless queries: energy in decibels and the power spectrum of a frame.
#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <vector>

#include "orvalis.h"
#include "tests/support/random.h"

namespace orvalis::test {
namespace {

using Block = std::vector<int16_t>;

int32_t energy(const Block &x) { return computeEnergy(x.data(), static_cast<int32_t>(x.size())); }

Block square(int length, int16_t amplitude) {
  Block x(length, amplitude);
  for (int i = 1; i < length; i += 2) x[i] = static_cast<int16_t>(-amplitude);
  return x;
}

TEST(Energy, KnownBlocks) {
  for (int level = -128; level <= 128; ++level) EXPECT_EQ(energy(Block(320, int16_t(level))), 0);
  for (int bit = 8; bit < 16; ++bit) EXPECT_EQ(energy(Block(320, int16_t(-1 << bit))), 0) << bit;
  for (const auto &[amplitude, decibels] : {std::pair{32767, 90}, {1000, 60}, {999, 59}, {1, 0}})
    EXPECT_EQ(energy(square(320, int16_t(amplitude))), decibels);
  // Mean -2.9 counts as -2, mean square 8.5 as 8: 8 - 4 is 6 dB.
  EXPECT_EQ(energy({-3, -3, -3, -3, -3, -3, -3, -3, -3, -2}), 6);
  // Mean 1.5 counts as 1, mean square 2.9 as 2.
  EXPECT_EQ(energy({3, 3, 2, 1, 1, 1, 1, 1, 1, 1}), 0);
}

TEST(Energy, IsTheVarianceInWholeDecibels) {
  std::mt19937_64 random = seeded_generator();
  int compared = 0;
  for (int i = 0; i < 4000; ++i) {
    Block x(64 + random() % 640);
    const int amplitude = 32767 >> i % 9;
    for (int16_t &sample : x)
      sample = static_cast<int16_t>(static_cast<int>(random() % (2 * amplitude + 1)) - amplitude);
    int64_t sum = 0, squares = 0;
    for (const int64_t sample : x) {
      sum += sample;
      squares += sample * sample;
    }
    const auto n = static_cast<int64_t>(x.size());
    const int64_t variance = squares / n - (sum / n) * (sum / n);
    const double decibels = variance < 1 ? 0 : 10 * std::log10(static_cast<double>(variance));
    // Single precision may fall on either side of a whole decibel, not further.
    if (variance > 100 && std::abs(decibels - std::round(decibels)) < 0.002) continue;
    ASSERT_EQ(energy(x), static_cast<int>(decibels)) << "block " << i << ", variance " << variance;
    ++compared;
  }
  EXPECT_GT(compared, 3500);
}

TEST(Energy, SquaresAreAddedInOrderInSinglePrecision) {
  EXPECT_EQ(energy({30001}), 14) << "its square is rounded up by 31";
  // Beside one full-scale square the small ones vanish, unless they have added up before it.
  Block x = square(3500001, 5);
  x.front() = 32767;
  EXPECT_EQ(energy(x), 24);
  std::swap(x.front(), x.back());
  EXPECT_EQ(energy(x), 25);
}

TEST(Energy, LoudestBlockOfTwentyMilliseconds) {
  Block x = square(1280, 10);
  const Block loud = square(320, 1000);
  std::copy(loud.begin(), loud.end(), x.begin() + 640);
  EXPECT_EQ(ComputeEnergy(x.data(), 1280, 16000), 60);
  EXPECT_EQ(ComputeEnergy(x.data(), 640, 16000), 20);
  EXPECT_EQ(ComputeEnergy(x.data(), 641, 16000), 60);
  EXPECT_EQ(ComputeEnergy(x.data(), 1, 16000), 20);
  // At 24 kHz a block is 480 samples: 160 of the loud ones in it. The rest fills the next one.
  EXPECT_EQ(ComputeEnergy(x.data(), 480, 24000), 20);
  EXPECT_EQ(ComputeEnergy(x.data(), 960, 24000), 58);
  // 99 Hz gives blocks of one sample.
  EXPECT_EQ(ComputeEnergy(x.data(), 1280, 99), 0);
  // A last partial block is read whole: half of it, behind the count, is at 60 dB.
  Block longer(640, 0);
  std::copy_n(loud.begin(), 160, longer.begin() + 480);
  EXPECT_EQ(ComputeEnergy(longer.data(), 480, 16000), 56);
  EXPECT_EQ(ComputeEnergy(longer.data(), 320, 16000), 0);
}

TEST(Queries, RefuseAndKeepToTheirBounds) {
  const Block x = square(320, 1000);
  for (const int32_t n : {0, -1, INT32_MIN}) {
    EXPECT_EQ(computeEnergy(x.data(), n), 0);
    EXPECT_EQ(ComputeEnergy(x.data(), n, 16000), 0);
  }
  for (const int32_t rate : {49, 0, INT32_MIN}) EXPECT_EQ(ComputeEnergy(x.data(), 320, rate), 0);
  EXPECT_EQ(computeEnergy(nullptr, 320), 0);
  EXPECT_EQ(ComputeEnergy(nullptr, 320, 16000), 0);
  for (const int32_t rate : {16000, 8000, 44100, 0, -16000}) {
    const std::size_t bins = rate == 16000 ? 128 : 64;
    const Block pcm(rate == 16000 ? 160 : 80, 1000);  // the sanitizers see a longer read
    std::vector<int32_t> got(bins + 1, -7);
    EXPECT_EQ(getSpectrum(nullptr, got.data(), rate), 0);
    EXPECT_EQ(getSpectrum(pcm.data(), nullptr, rate), 0);
    EXPECT_EQ(got, std::vector<int32_t>(bins + 1, -7));
    EXPECT_EQ(getSpectrum(pcm.data(), got.data(), rate), 1);
    EXPECT_EQ(std::count(got.begin(), got.end(), -7), 1) << rate;
  }
}

}  // namespace
}  // namespace orvalis::test
