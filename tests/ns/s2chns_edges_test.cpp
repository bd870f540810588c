// The two-microphone suppressor at its edges: gate, lengths, overflow.
#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <cmath>
#include <cstddef>
#include <limits>
#include <memory>
#include <utility>
#include <vector>

#include "Voice_Engine/ns/s2chns.h"
#include "tests/support/noise.h"

namespace orvalis::test {
namespace {

/// Everything that the next frame depends on.
std::vector<std::byte> memory_of(const S2chnsState &state) {
  const auto *bytes = reinterpret_cast<const std::byte *>(&state);
  return {bytes, bytes + sizeof state};
}

Pcm hiss(int frames, unsigned seed) {
  const auto noise = unit_noise(320 * frames, NoiseColour::kWhite, seed);
  Pcm pcm;
  for (const double value : noise) pcm.push_back(to_sample(3000 * value));
  return pcm;
}

TEST(S2chnsEdges, LeavesQuietFramesAndOddLengthsAlone) {
  const auto state = std::make_unique<S2chnsState>();
  Pcm pairs = hiss(40, 5), out(320);
  for (int frame = 0; frame < 40; ++frame)
    S2CHNSProcessNSFrame(*state, &pairs[320 * frame], out.data(), 160);
  const auto before = memory_of(*state);
  const Pcm untouched(320, 12345);
  out = untouched;
  for (const Word16 n : {100, 1, 159, 161, -1, -159, -32768})
    EXPECT_EQ(S2CHNSProcessNSFrame(*state, pairs.data(), out.data(), n), -100) << n;
  for (const Word16 n : {0, -160, -32640})
    EXPECT_EQ(S2CHNSProcessNSFrame(*state, pairs.data(), out.data(), n), 0) << n;
  for (int i = 0; i < 160; ++i) pairs[2 * i] = static_cast<Word16>(i % 2 ? -10 : 10);
  pairs[10] = 9;  // the second microphone may be loud
  EXPECT_EQ(S2CHNSProcessNSFrame(*state, pairs.data(), out.data(), 160), 0);
  EXPECT_EQ(out, untouched);
  EXPECT_EQ(memory_of(*state), before);
  pairs[10] = -10;
  EXPECT_EQ(S2CHNSProcessNSFrame(*state, pairs.data(), out.data(), 160), 0);
  EXPECT_NE(out, untouched);
  EXPECT_NE(memory_of(*state), before);
}

TEST(S2chnsEdges, WrapsWhatExceedsSixteenBits) {
  const float infinity = std::numeric_limits<float>::infinity();
  const std::pair<float, Word16> cases[] = {{40000, 40000 - 65536},
                                            {-40000.5F, 65536 - 40000},
                                            {100000, 100000 - 131072},
                                            {32766, 32766},
                                            {-32768, -32768},
                                            {2147483520.0F, -128},
                                            {3e9F, -1},
                                            {-3e9F, 0},
                                            {infinity, -1},
                                            {-infinity, 0},
                                            {std::nanf(""), 0}};
  const auto state = std::make_unique<S2chnsState>();
  for (std::size_t i = 0; i < std::size(cases); ++i) state->overlap_tail[i] = cases[i].first;
  Pcm pairs(320), out(320);
  for (int i = 300; i < 320; ++i) pairs[i] = 1000;  // far from the samples in question
  S2CHNSProcessNSFrame(*state, pairs.data(), out.data(), 160);
  for (std::size_t i = 0; i < std::size(cases); ++i)
    EXPECT_EQ(out[2 * i], cases[i].second) << cases[i].first;
}

TEST(S2chnsEdges, HoldsExponentsAndProbabilitiesAndMovesBlocks) {
  EXPECT_EQ(SAFE_EXP(-10.001F), 4.539993e-5F);
  EXPECT_EQ(SAFE_EXP(-HUGE_VALF), 4.539993e-5F);
  EXPECT_EQ(SAFE_EXP(10.001F), 22026.465F);
  EXPECT_EQ(SAFE_EXP(HUGE_VALF), 22026.465F);
  for (const float x : {-10.0F, -1.5F, 0.0F, 0.3F, 10.0F})
    EXPECT_FLOAT_EQ(SAFE_EXP(x), static_cast<float>(std::exp(static_cast<double>(x))));
  for (const auto &[x, held] :
       {std::pair{-0.1F, 0.0F}, {0.0F, 0.0F}, {0.3F, 0.3F}, {1.0F, 1.0F}, {1.1F, 1.0F}})
    EXPECT_EQ(SAFE_SAP(x), held);
  const std::array<float, 4> from = {1, 2, 3, 4};
  std::array<float, 4> to = {5, 6, 7, 8};
  for (const Word16 none : {0, -1, -32768}) {
    buffercopy(from.data(), to.data(), none);
    bufferreset(to.data(), none);
  }
  EXPECT_EQ(to, (std::array<float, 4>{5, 6, 7, 8}));
  buffercopy(from.data(), to.data(), 3);
  EXPECT_EQ(to, (std::array<float, 4>{1, 2, 3, 8}));
  bufferreset(to.data(), 2);
  EXPECT_EQ(to, (std::array<float, 4>{0, 0, 3, 8}));
  EXPECT_EQ(S2CHNSFree(), 0);
}

}  // namespace
}  // namespace orvalis::test
