// The MCRA detector: every field of the record after every call, and the frame, which is windowed
// in place.
#include <memory>

#include "Voice_Engine/MCRAvad/MCRAvad.h"
#include "tests/digests/observe.h"

namespace orvalis::test {
namespace {

void take_record(Judge &judge, const VADINFO &vad) {
  judge.take(
      vad.frameIndex, vad.periodogram, vad.smoothedPeriodogram, vad.recursivePower, vad.minPower,
      vad.minHistory, vad.presenceIndicatorAvg, vad.noiseSmoothing, vad.noisePower, vad.postSnr,
      vad.prioriSnr, vad.gain, vad.prioriSnrAvg, vad.frameSnr, vad.speechProb, vad.energyThreshold,
      vad.prevSmoothedEnergy, vad.prevMinEnergy, vad.prevFrameEnergy, vad.prevSpeechBins,
      vad.startupSmoothedEnergy, vad.startupFrameEnergy, vad.reserved, vad.historyUpdate,
      vad.calibrationMode, vad.calibrationEnable, vad.lowThresholdSelect, vad.calibrationDone,
      vad.calibrationPhase, vad.energyMargin, vad.calibrationIndex, vad.calibrationBest,
      vad.calibrationOlderSum, vad.calibrationNewerSum, vad.calibrationPeak, vad.calibrationCount);
}

struct Configuration {
  std::int32_t history, calibration_mode, calibration_enable, low_threshold, margin;
  float exponent;
};

void configure(VADINFO &vad, const Configuration &configured) {
  vad.historyUpdate = configured.history;
  vad.calibrationMode = configured.calibration_mode;
  vad.calibrationEnable = configured.calibration_enable;
  vad.lowThresholdSelect = configured.low_threshold;
  vad.energyMargin = configured.margin;
}

void run(Judge &judge, const Pcm &audio, const Configuration &configured, Random random,
         bool hostile) {
  Observer observer(judge);
  const auto record = std::make_unique<VADINFO>();
  VADINFO *vad = record.get();
  std::memset(vad, 0x5A, sizeof *vad);  // fields that initialVADINFO does not set keep this
  initialVADINFO(&vad);
  take_record(judge, *vad);
  observer.call();
  *vad = {};
  initialVADINFO(&vad);
  configure(*vad, configured);
  for (std::size_t at = 0; at + 160 <= audio.size(); at += 160) {
    Pcm frame(audio.begin() + static_cast<long>(at), audio.begin() + static_cast<long>(at + 160));
    const auto oddity = hostile ? draw(random, 0, 199) : 199;
    if (hostile) observer.disturb_flags(random);
    if (oddity == 0) initialVADINFO(&vad);
    if (oddity == 1) reset_MCRA_params(&vad);
    if (oddity == 2) vad->historyUpdate = static_cast<std::int32_t>(draw(random, 0, 2));
    if (oddity == 3) vad->energyMargin = static_cast<std::int32_t>(draw(random, 1, 2));
    const auto length = oddity < 12 ? pick(random, {0, -1, 100, 159, 161, 4000}) : 160;
    if (oddity == 20) {
      ApplyVAD(&vad, frame.data(), length);
    } else {
      judge.take(processVAD(&vad, frame.data(), length, configured.exponent));
    }
    judge.take(frame);
    take_record(judge, *vad);
    observer.call();
  }
}

/// The reasons of every frame, and that their decision is that of the frame.
void run_explained(Judge &judge, const Pcm &audio, const Configuration &configured) {
  const auto record = std::make_unique<VADINFO>();
  VADINFO *vad = record.get();
  initialVADINFO(&vad);
  configure(*vad, configured);
  McraReasons reasons{};
  for (std::size_t at = 0; at + 160 <= audio.size(); at += 160) {
    Pcm frame(audio.begin() + static_cast<long>(at), audio.begin() + static_cast<long>(at + 160));
    const std::int32_t answer = processVAD(&vad, frame.data(), 160, configured.exponent);
    EXPECT_EQ(explainVAD(&vad, &reasons), answer);
    judge.take(reasons.frameIndex, reasons.answer, reasons.energy, reasons.energyThreshold,
               reasons.smoothedEnergy, reasons.smoothedThreshold, reasons.minEnergy,
               reasons.frameSnr, reasons.speechBins, reasons.speechBinsThreshold);
    judge.call();
  }
}

TEST(Digests, Mcra) {
  Judge judge("mcra");
  const Pcm sentence = speech_16k(kSentences[3]);
  const Pcm narrow = speech_8k("wav/hts1a.wav");
  judge.sequence("sentence", [&] {
    run(judge, sentence, {0, 0, 0, 0, 2, 0.84F}, Random(1), false);
  });
  judge.sequence("history-calibrating", [&] {
    run(judge, sentence, {1, 1, 1, 0, 2, 0.84F}, Random(1), false);
  });
  judge.sequence("narrow", [&] { run(judge, narrow, {1, 0, 0, 1, 1, 0.84F}, Random(1), false); });
  const Configuration configurations[] = {
      {0, 0, 0, 0, 2, 0.84F}, {1, 1, 1, 1, 1, 0.5F}, {0, 0, 1, 1, 2, 0.84F},
      {1, 1, 0, 0, 1, 0.9F},  {0, 1, 1, 0, 2, 0.7F}, {2, 1, 2, 2, 3, 0.95F},
  };
  std::uint64_t seed = 400;
  for (const Configuration &configured : configurations) {
    ++seed;
    judge.sequence("hostile-" + std::to_string(seed), [&] {
      run(judge, hostile_signal(seed, 100000, sentence), configured, Random(seed), true);
    });
  }
  for (const Configuration &configured : configurations) {
    ++seed;
    judge.sequence("reasons-" + std::to_string(seed), [&] {
      run_explained(judge, hostile_signal(seed, 60000, sentence), configured);
    });
  }
  judge.sequence("calibration", [&] {
    run(judge, hostile_signal(420, 100000, sentence), {0, 1, 1, 1, 2, 0.9F}, Random(1), false);
  });
}

}  // namespace
}  // namespace orvalis::test
