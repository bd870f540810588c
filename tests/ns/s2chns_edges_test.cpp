// The two-microphone suppressor at its edges: overflow, exponents, blocks.
#include <gtest/gtest.h>

#include <array>
#include <cmath>
#include <limits>
#include <memory>
#include <utility>

#include "Voice_Engine/ns/s2chns.h"
#include "tests/support/recordings.h"

namespace orvalis::test {
namespace {

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
