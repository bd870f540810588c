// The frame decision, the calibration of its threshold, and what the entries set.
#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <memory>

#include "Voice_Engine/MCRAvad/frame_decision.h"

namespace orvalis::test {
namespace {

/// What the decision depends on in a frame.
struct Measures {
  double energy;
  double smoothed_energy;
  double minimum_energy;
  int speech_bins;
};

class McraDecision : public testing::Test {
protected:
  McraDecision() { initialVADINFO(&info_); }

  /// Decides the next frame.
  bool decide(const Measures &frame, float exponent = 0.84F) {
    VADINFO &vad = *info_;
    ++vad.frameIndex;
    // Over several bins, so that all of them have to be added up.
    for (int k = 0; k < MCRA_BINS; ++k) {
      vad.periodogram[k] = k % 64 == 63 ? std::llrint(frame.energy * 0x1p30) : 0;
      vad.smoothedPeriodogram[k] = k % 64 == 0 ? std::llrint(frame.smoothed_energy * 0x1p30) : 0;
      vad.minPower[k] = k / 64 == 1 ? std::llrint(frame.minimum_energy * 0x1p25) : 0;
      vad.speechProb[k] = k < frame.speech_bins ? INT32_MAX : 0;
    }
    // The probability of a bin is at most 1 - 2^-31: the missing units are added, and half a bin
    // more does not change the count.
    vad.speechProb[MCRA_BINS - 1] += frame.speech_bins + (1 << 30);
    return decide_frame(vad, exponent);
  }

  VADINFO record_{};
  VADINFO *info_ = &record_;
};

constexpr Measures kVoice{50, 25, 0.25, 30};
constexpr Measures kNothing{0, 0, 0, 0};

TEST_F(McraDecision, EveryConditionIsStrictAndOverTwoFrames) {
  EXPECT_FALSE(decide(kVoice)) << "the first frame";
  EXPECT_EQ(record_.prevFrameEnergy, 0);
  EXPECT_EQ(record_.prevSpeechBins, 0);

  struct Case {
    const char *name;
    float threshold;
    int low_threshold, margin;
    Measures before, frame;
    bool expected;
  };
  // Binary fractions, so that a sum can equal its limit exactly.
  const Case kCases[] = {
      {"all met", 0.5F, 0, 1, {.25, .75, 0, 20}, {.375, .75, 0, 21}, true},
      {"energy equals threshold", 0.5F, 0, 1, {.25, .75, 0, 20}, {.25, .75, 0, 21}, false},
      {"energy equals floor", -1, 0, 1, {0, .75, 0, 20}, {double(0.1F), .75, 0, 21}, false},
      {"energy above low floor", -1, 1, 1, {0, .75, 0, 20}, {.0975, .75, 0, 21}, true},
      {"energy below low floor", -1, 1, 1, {0, .75, 0, 20}, {.0965, .75, 0, 21}, false},
      {"any other selection is the floor", -1, 2, 1, {0, .75, 0, 20}, {.0975, .75, 0, 21}, false},
      {"smoothed energy equals margin", .1F, 0, 1, {1, .5, 0, 20}, {1, .5, 0, 21}, false},
      {"smoothed energy equals margin 2", .1F, 0, 2, {1, 1, 0, 20}, {1, 1, 0, 21}, false},
      {"smoothed energy at 0.4", .1F, 0, 0, {1, 0, 0, 20}, {1, double(0.4F), 0, 21}, false},
      {"smoothed energy above 0.4", .1F, 0, 0, {1, 0, 0, 20}, {1, .4001, 0, 21}, true},
      {"40 bins", .1F, 0, 1, {1, 1, 0, 20}, {1, 1, 0, 20}, false},
      {"41 bins", .1F, 0, 1, {1, 1, 0, 41}, {1, 1, 0, 0}, true},
      {"not a number is no threshold", NAN, 0, 1, {1, 1, 0, 20}, {1, 1, 0, 21}, true},
  };
  for (const Case &c : kCases) {
    record_.frameIndex = 40;
    record_.energyThreshold = c.threshold;
    record_.lowThresholdSelect = c.low_threshold;
    record_.energyMargin = c.margin;
    decide(c.before);
    EXPECT_EQ(decide(c.frame), c.expected) << c.name;
  }
}

TEST_F(McraDecision, StartupLearnsFromTenAndNineteenFrames) {
  decide(kNothing);
  for (int n = 1; n <= 30; ++n) {
    // Frame 5 is too loud: frame 4 counts again. Frames from 20 on are not added.
    const double energy = n == 5 ? 30.25 : n == 6 ? 30 : n < 20 ? n * 0.125 : 30.5;
    decide({1, energy, 0, 0});
    EXPECT_EQ(record_.prevSmoothedEnergy, n == 5 ? 0.5 : energy);
  }
  EXPECT_EQ(record_.startupFrameEnergy, 19);  // 1, then nine times 2
  EXPECT_EQ(record_.startupSmoothedEnergy, 0.125F * (190 - 1 - 6) + 30);
}

TEST_F(McraDecision, ScaleFollowsTheStartOrTheMinima) {
  struct Case {
    float startup;
    int calibration_enable;
    double minimum, limit;  // of two frames' smoothed energy, with a margin of 2
  };
  const Case kCases[] = {{10, 0, 9, 1},           {10.5F, 0, 9, 2},     {20, 0, 9, 2},
                         {40, 0, 9, 4},           {40, 1, 0.75, 1.875}, {40, -1, 0.75, 1.875},
                         {10, 1, 0.1875, 0.46875}};
  for (const Case &c : kCases) {
    record_.startupSmoothedEnergy = c.startup;
    record_.calibrationEnable = c.calibration_enable;
    for (const double above : {0.0, 0.0625}) {
      SCOPED_TRACE(testing::Message() << c.startup << ' ' << c.calibration_enable << ' ' << above);
      // Up to frame 79 the scale is 1.
      record_.frameIndex = 77;
      decide({1, 1, c.minimum, 30});
      EXPECT_EQ(decide({1, 1 + above, c.minimum, 30}), above > 0);
      // The minima of frame 80 and of its predecessor, which has a quarter of them.
      record_.frameIndex = 78;
      decide({1, 0, 0.25 * c.minimum, 30});
      EXPECT_EQ(decide({1, c.limit + above, c.minimum, 30}), above > 0);
    }
  }
}

TEST_F(McraDecision, ThresholdServesTheFrameThatCalibratedIt) {
  reset_MCRA_params(&info_);
  record_.calibrationEnable = record_.calibrationMode = 1;
  record_.frameIndex = 78;
  decide(kVoice, 1);
  for (int count = 1; count < 90; ++count) EXPECT_TRUE(decide(kVoice, 1)) << count;
  record_.calibrationBest = 1e6F;
  EXPECT_FALSE(decide(kVoice, 1));
  EXPECT_GT(record_.energyThreshold, 100);

  record_.calibrationMode = 2;
  const VADINFO before = record_;
  decide(kVoice, 1);
  EXPECT_EQ(record_.calibrationCount, before.calibrationCount) << "only mode 1 calibrates";
}

TEST(McraEntries, WindowTheFirstSamplesOfTheCallersFrame) {
  const auto record = std::make_unique<VADINFO>();
  VADINFO *vad = record.get();
  initialVADINFO(&vad);
  for (const int length : {160, 100, 0, -1, 1000}) {
    std::int16_t frame[162];
    std::fill(std::begin(frame), std::end(frame), std::int16_t{1000});
    ApplyVAD(&vad, frame, length);
    for (int i = 0; i < 162; ++i) {
      const bool windowed = i < std::min(length, 160);
      const double weight = windowed ? 0.5 - 0.5 * std::cos(2 * M_PI * i / 159.5) : 1;
      EXPECT_NEAR(frame[i], 1000 * weight, windowed ? 0.6 : 0) << i;
    }
  }
}

}  // namespace
}  // namespace orvalis::test
