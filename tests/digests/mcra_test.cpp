// Every bit of a record of the MCRA detector after every frame.
#include <gtest/gtest.h>

#include <memory>

#include "Voice_Engine/MCRAvad/MCRAvad.h"
#include "tests/support/digest.h"
#include "tests/support/recordings.h"

namespace orvalis::test {
namespace {

std::uint32_t digest_of(const VADINFO &vad, std::int32_t answer) {
  Digest digest;
  digest.take(answer, vad.frameIndex, vad.periodogram, vad.smoothedPeriodogram, vad.recursivePower,
              vad.minPower, vad.minHistory, vad.presenceIndicatorAvg, vad.noiseSmoothing,
              vad.noisePower, vad.postSnr, vad.prioriSnr, vad.gain, vad.prioriSnrAvg, vad.frameSnr,
              vad.speechProb, vad.energyThreshold, vad.prevSmoothedEnergy, vad.prevMinEnergy,
              vad.prevFrameEnergy, vad.prevSpeechBins, vad.startupSmoothedEnergy,
              vad.startupFrameEnergy, vad.reserved, vad.historyUpdate, vad.calibrationMode,
              vad.calibrationEnable, vad.lowThresholdSelect, vad.calibrationDone,
              vad.calibrationPhase, vad.energyMargin, vad.calibrationIndex, vad.calibrationBest,
              vad.calibrationOlderSum, vad.calibrationNewerSum, vad.calibrationPeak,
              vad.calibrationCount);
  return digest.value();
}

Digests digests_of(Pcm pcm, std::int32_t keeps_history, std::int32_t calibrates) {
  const auto record = std::make_unique<VADINFO>();
  VADINFO *vad = record.get();
  initialVADINFO(&vad);
  vad->historyUpdate = keeps_history;
  vad->calibrationMode = vad->calibrationEnable = calibrates;
  Digests digests;
  for (std::size_t at = 0; at + 160 <= pcm.size(); at += 160) {
    const std::int32_t answer = processVAD(&vad, &pcm[at], 160, 0.84F);
    digests.push_back(digest_of(*vad, answer));
  }
  // To the end of the calibration.
  EXPECT_EQ(vad->calibrationDone, calibrates);
  return digests;
}

TEST(Digests, OfTheMcraDetectorAreTheSameEverywhere) {
  ExpectedDigests file("mcra.txt");
  file.expect("sentence", digests_of(speech_16k(kSentences[3]), 0, 0));
  file.expect("history-calibrating", digests_of(speech_16k(kSentences[3]), 1, 1));
  file.expect("narrow", digests_of(speech_8k("wav/hts1a.wav"), 1, 0));
}

}  // namespace
}  // namespace orvalis::test
