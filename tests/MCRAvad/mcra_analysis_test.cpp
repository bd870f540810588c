// The analysis of a frame: what its steps mean.
#include <gtest/gtest.h>

#include <cmath>
#include <memory>

#include "Voice_Engine/MCRAvad/noise_spectrum.h"
#include "Voice_Engine/MCRAvad/speech_presence.h"
#include "tests/support/recordings.h"

namespace orvalis::test {
namespace {

constexpr std::int64_t kNever = 0x0101010101010101;  // a minimum of no spectrum

/// A detector as new.
class Detector {
public:
  explicit Detector(bool keeps_history) {
    VADINFO *vad = info_.get();
    initialVADINFO(&vad);
    vad->historyUpdate = keeps_history;
  }
  VADINFO *operator->() const { return info_.get(); }
  VADINFO &operator*() const { return *info_; }
  std::int32_t process(Pcm frame) const {
    VADINFO *vad = info_.get();
    return processVAD(&vad, frame.data(), 160, 0.84F);
  }

private:
  std::unique_ptr<VADINFO> info_ = std::make_unique<VADINFO>();
};

Pcm frame_of(double (*wave)(int), double level) {
  Pcm frame(160);
  for (int i = 0; i < 160; ++i)
    frame[static_cast<std::size_t>(i)] = static_cast<std::int16_t>(std::lrint(level * wave(i)));
  return frame;
}

const auto kTone = [](int i) { return std::sin(0.3 * i); };

TEST(McraAnalysis, MinimaOfAllTimeFallAndThoseOfTheRingRiseAgain) {
  const Pcm loud = frame_of(kTone, 8000), quiet = frame_of(kTone, 800);
  constexpr int kBin = 12;  // of the tone
  const Detector falling(false), ring(true);
  std::int64_t averages[80];
  for (int i = 0; i < 80; ++i) {
    for (const Detector *vad : {&falling, &ring}) vad->process(i < 30 ? quiet : loud);
    averages[i] = ring->recursivePower[kBin];
    EXPECT_EQ(falling->minPower[kBin], averages[0]) << i;
    // S only rises here, so the oldest of the last 20 is the minimum; frame 20 is the first to
    // write slot 0 again.
    EXPECT_EQ(ring->minPower[kBin], averages[std::max(i - 19, 0)]) << i;
    EXPECT_EQ(ring->minHistory[i % 20][kBin], averages[i]) << i;
  }
  EXPECT_GT(ring->minPower[kBin], 10 * falling->minPower[kBin]);
  EXPECT_EQ(falling->minHistory[0][kBin], averages[0]);
  for (int slot = 1; slot < MCRA_HISTORY; ++slot)
    EXPECT_EQ(falling->minHistory[slot][kBin], kNever);

  const Detector silent(true);
  for (int i = 0; i < 25; ++i) silent.process(Pcm(160));
  for (int k = 0; k < MCRA_BINS; ++k) {
    EXPECT_EQ(silent->minPower[k], 21474);
    EXPECT_EQ(silent->minHistory[24 % 20][k], 21474);
    EXPECT_EQ(silent->recursivePower[k], 0);
  }
}

TEST(McraAnalysis, NoiseTakesAFrameInOneFrameLate) {
  constexpr double kOne = 1 - 0x1p-31;  // as far as Q31 goes
  const Detector vad(true);
  for (int i = 0; i < 60; ++i) {
    const VADINFO before = *vad;
    vad.process(frame_of(kTone, i % 2 == 0 ? 100 : 20000));
    if (i == 0) continue;
    for (int k = 0; k < MCRA_BINS; ++k) {
      const double kept = before.noiseSmoothing[k] / 0x1p31;
      const double noise = kept * static_cast<double>(before.noisePower[k]) +
                           (kOne - kept) * static_cast<double>(before.smoothedPeriodogram[k]);
      EXPECT_NEAR(static_cast<double>(vad->noisePower[k]), noise, 2 + 1e-8 * noise);
      // p' of 1 stops the update of the noise; with 0 a thousandth of the frame enters.
      const double presence = vad->presenceIndicatorAvg[k] / 0x1p31;
      EXPECT_NEAR(vad->noiseSmoothing[k] / 0x1p31, 0.999 + 0.001 * presence, 2e-9);
    }
  }
}

/// One step of a bin from chosen powers and history, against the published formulas.
TEST(McraAnalysis, SnrGainAndProbabilityAreThePublishedOnes) {
  const Detector vad(false);
  double least = 1, worst = 0;
  int negligible = 0;
  for (int step = 0; step < 400; ++step) {
    vad->frameIndex = step % 2;
    const double posterior = std::pow(10, step / 200.0 - 0.5);  // to 15 dB
    for (int k = 0; k < MCRA_BINS; ++k) {
      vad->noisePower[k] = 1 << 24;
      vad->smoothedPeriodogram[k] = std::llrint(posterior * (1 << 24));
      vad->gain[k] = 32768 * k / 127;
      vad->postSnr[k] = 1024 * 8;
      vad->prioriSnr[k] = vad->prioriSnrAvg[k] = 0;
    }
    update_presence(*vad);
    for (int k = 0; k < MCRA_BINS; ++k) {
      const double carried = step % 2 == 0 ? 0 : 0.92 * std::pow(k / 127.0, 2) * 8;
      const double prior = 0.08 * std::max(posterior - 1, 0.0) + carried;
      ASSERT_NEAR(vad->prioriSnr[k] / 4096.0, prior, 2e-3 + 1e-3 * prior);
      const double xi = vad->prioriSnr[k] / 4096.0;
      const double v = posterior * xi / (1 + xi);
      const double gain = xi / (1 + xi) * std::exp(-0.5 * std::expint(-v));
      if (v > 0.05) {
        ASSERT_NEAR(vad->gain[k] / 32768.0, gain, 1e-3 + 0.002 * gain) << posterior << ' ' << xi;
      }
      // Without SNR around it q is 0.95.
      const double p = 1 / (1 + 19 * (1 + xi) * std::exp(-v));
      const double first = std::min(1.0, 18 / (2 + 19 * (1 + xi) * std::exp(-v)));
      const double got = vad->speechProb[k] / 0x1p31;
      if (got == 0) {
        ASSERT_LT(step % 2 == 0 ? first : p, 0.0511);
        ++negligible;
      } else {
        ASSERT_NEAR(got, step % 2 == 0 ? first : p, 0.004);
        least = std::min(least, got);
        worst = std::max(worst, std::fabs(got - (step % 2 == 0 ? first : p)));
      }
    }
  }
  EXPECT_GT(negligible, 1000);
  EXPECT_GE(least, 0.051);
  EXPECT_LT(least, 0.0512);
  std::printf("least probability %.6f, largest error %.5f\n", least, worst);

  // e^-v stops at v = 20, so that a prior of 2^19 still leaves a chance of noise.
  vad->frameIndex = 1;
  vad->noisePower[0] = 1;  // the SNR is then the power itself
  vad->smoothedPeriodogram[0] = INT64_MAX;
  vad->gain[0] = 0;
  update_presence(*vad);
  EXPECT_EQ(vad->postSnr[0], INT32_MAX);
  const double xi = vad->prioriSnr[0] / 4096.0;
  EXPECT_NEAR(xi, 0.08 * 0x1p21, 1);
  EXPECT_NEAR(vad->speechProb[0] / 0x1p31, 1 / (1 + 19 * (1 + xi) * std::exp(-20)), 1e-3);
}

TEST(McraAnalysis, SurroundingsWeighFromTheirFirstBin) {
  const Detector vad(false);
  vad->frameIndex = 1;
  for (int k = 0; k < MCRA_BINS; ++k) {
    vad->noisePower[k] = 1 << 24;
    vad->smoothedPeriodogram[k] = 4 << 24;
    // Bins 30 to 40 carry the frame; 5 and 122 are alone, 5 bins from an edge.
    vad->prioriSnrAvg[k] = k >= 30 && k <= 40 ? 100000 : k == 5 || k == 122 ? 50000 : 0;
    vad->prioriSnr[k] = vad->prioriSnrAvg[k];
  }
  update_presence(*vad);
  EXPECT_NEAR(vad->frameSnr, (11 * 100000 + 50000) / 41.0, 1);
  EXPECT_NEAR(vad->prioriSnrAvg[5], 50000, 1);
  const double xi = vad->prioriSnr[5] / 4096.0, v = 4 * xi / (1 + xi);
  const auto chance = [&](double absence) {
    return 1 / (1 + absence / (1 - absence) * (1 + xi) * std::exp(-v));
  };
  // At the upper edge the weight 1 lies on the bin itself: 50000 / 4 of 2044 to 32382. At the lower
  // edge 0.146 does, which is below 2044.
  const double local = std::log(50000 / 8174.0) / std::log(129527 / 8174.0);
  const double global = std::log(50000 / 4 / 2044.0) / std::log(32382 / 2044.0);
  EXPECT_NEAR(vad->speechProb[122] / 0x1p31, chance(1 - local * global), 0.003);
  EXPECT_NEAR(vad->speechProb[5] / 0x1p31, chance(0.95), 0.003);
}

}  // namespace
}  // namespace orvalis::test
