// The MCRA detector: every field of the record after every call, and the frame, which is windowed
// in place.
#include <array>
#include <cmath>
#include <memory>

#include "Voice_Engine/MCRAvad/MCRAvad.h"
#include "Voice_Engine/MCRAvad/frame_decision.h"
#include "Voice_Engine/MCRAvad/speech_presence.h"
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

/// Historyless or not, calibration's mode and switch, threshold, margin, exponent.
struct Configuration {
  std::int32_t history, calibration_mode, calibration_enable, low_threshold, margin;
  float exponent;
};

VADINFO *configured(VADINFO &record, const Configuration &with) {
  VADINFO *vad = &record;
  initialVADINFO(&vad);
  vad->historyUpdate = with.history;
  vad->calibrationMode = with.calibration_mode;
  vad->calibrationEnable = with.calibration_enable;
  vad->lowThresholdSelect = with.low_threshold;
  vad->energyMargin = with.margin;
  return vad;
}

void run(Judge &judge, const std::string &name, const Pcm &audio, const Configuration &with,
         Caller caller = Caller(1, false)) {
  judge.sequence(name, [&] {
    Observer observer(judge);
    auto &[random, hostile] = caller;
    const auto record = std::make_unique<VADINFO>();
    VADINFO *vad = record.get();
    std::memset(vad, 0x5A, sizeof *vad);  // fields that initialVADINFO does not set keep this
    initialVADINFO(&vad);
    take_record(judge, *vad);
    observer.call();
    *vad = {};
    configured(*vad, with);
    for (std::size_t at = 0; at + 160 <= audio.size(); at += 160) {
      Pcm frame = cut(audio, at, 160);
      const auto oddity = hostile ? draw(random, 0, 199) : 199;
      if (hostile) observer.disturb_flags(random);
      if (oddity == 0) initialVADINFO(&vad);
      if (oddity == 1) reset_MCRA_params(&vad);
      if (oddity == 2) vad->historyUpdate = static_cast<std::int32_t>(draw(random, 0, 2));
      if (oddity == 3) vad->energyMargin = static_cast<std::int32_t>(draw(random, 1, 2));
      const auto length = oddity < 12 ? pick(random, {0, -1, 100, 159, 161, 4000}) : 160;
      if (oddity == 20)
        ApplyVAD(&vad, frame.data(), length);
      else
        judge.take(processVAD(&vad, frame.data(), length, with.exponent));
      judge.take(frame);
      take_record(judge, *vad);
      observer.call();
    }
  });
}

/// The reasons of every frame, and that their decision is that of the frame.
void run_explained(Judge &judge, const std::string &name, const Pcm &audio,
                   const Configuration &with) {
  judge.sequence(name, [&] {
    const auto record = std::make_unique<VADINFO>();
    VADINFO *vad = configured(*record, with);
    McraReasons reasons{};
    for (std::size_t at = 0; at + 160 <= audio.size(); at += 160) {
      const std::int32_t answer = processVAD(&vad, cut(audio, at, 160).data(), 160, with.exponent);
      EXPECT_EQ(explainVAD(&vad, &reasons), answer);
      judge.take(reasons.frameIndex, reasons.answer, reasons.energy, reasons.energyThreshold,
                 reasons.smoothedEnergy, reasons.smoothedThreshold, reasons.minEnergy,
                 reasons.frameSnr, reasons.speechBins, reasons.speechBinsThreshold);
      judge.call();
    }
  });
}

/// The frame decision on both sides of its thresholds, from measures made for it.
void run_decisions(Judge &judge) {
  judge.sequence("decisions", [&] {
    VADINFO vad{};
    Random random(61);
    for (int i = 0; i < 1 << 15; ++i) {
      vad.frameIndex =
          i % 2 == 0 ? pick(random, {0, 5, 9, 10, 18, 19, 40, 77, 78, 79}) : vad.frameIndex + 1;
      vad.energyThreshold = pick(random, {.5F, -1.0F, NAN});
      vad.lowThresholdSelect = pick(random, {0, 1, 2});
      vad.energyMargin = pick(random, {0, 1, 2});
      vad.startupSmoothedEnergy = pick(random, {10.0F, 10.5F, 20.0F, 40.0F});
      vad.calibrationEnable = pick(random, {0, 0, 1, -1});
      vad.calibrationMode = pick(random, {0, 1, 2});
      vad.calibrationCount = pick(random, {vad.calibrationCount, INT32_MAX - 1, INT32_MAX});
      const float energy = pick(random, {0.0F, .0975F, .1F, .5F, .625F});
      const float smoothed = pick(random, {0.0F, .4F, .5F, .625F, 1.0F, 1.0625F, 30.0F, 30.25F});
      const int bins = pick(random, {20, 21});
      // Over several bins, so that all of them have to be added up.
      for (int k = 0; k < MCRA_BINS; ++k) {
        vad.periodogram[k] = k % 64 == 63 ? std::llrint(energy * 0x1p30) : 0;
        vad.smoothedPeriodogram[k] = k % 64 == 0 ? std::llrint(smoothed * 0x1p30) : 0;
        vad.minPower[k] = k / 64 == 1 ? std::llrint(.75 * 0x1p25) : 0;
        vad.speechProb[k] = k < bins ? INT32_MAX : 0;
      }
      vad.speechProb[MCRA_BINS - 1] += bins;  // what the greatest probability lacks to 1
      judge.take(orvalis::decide_frame(vad, 1.0F), vad.energyThreshold, vad.prevFrameEnergy,
                 vad.prevSmoothedEnergy, vad.prevMinEnergy, vad.prevSpeechBins,
                 vad.startupFrameEnergy, vad.startupSmoothedEnergy, vad.calibrationCount);
      if (i % 256 == 255) judge.call();
    }
  });
}

TEST(Digests, Mcra) {
  Judge judge("mcra");
  const Pcm sentence = speech_16k(kSentences[3]);
  run(judge, "sentence", sentence, {0, 0, 0, 0, 2, 0.84F});
  run(judge, "history-calibrating", sentence, {1, 1, 1, 0, 2, 0.84F});
  run(judge, "narrow", speech_8k("wav/hts1a.wav"), {1, 0, 0, 1, 1, 0.84F});
  run(judge, "calibration", hostile_signal(420, 100000, sentence), {0, 1, 1, 1, 2, 0.9F});
  run_decisions(judge);
  judge.sequence("presence", [&] {  // from the least noise, and where the count of frames ends
    VADINFO record{}, *vad = &record;
    record.frameIndex = INT32_MAX - 2;
    for (int k = 0; k < MCRA_BINS; ++k) {
      record.noisePower[k] = k % 4;
      record.smoothedPeriodogram[k] = k == 9 ? INT64_MAX : std::int64_t{k} << k / 4;
      record.gain[k] = record.postSnr[k] = 32768 * k / 127;
    }
    for (int i = 0; i < 4; ++i) {
      if (i == 0) orvalis::update_presence(record);
      if (i > 0) processVAD(&vad, Pcm(160, 9).data(), 160, 0.84F);
      take_record(judge, record);
      judge.call();
    }
  });
  std::uint64_t seed = 400;
  for (const Configuration &with : {Configuration{0, 0, 0, 0, 2, 0.84F},
                                    {1, 1, 1, 1, 1, 0.5F},
                                    {0, 0, 1, 1, 2, 0.84F},
                                    {1, 1, 0, 0, 1, 0.9F},
                                    {0, 1, 1, 0, 2, 0.7F},
                                    {2, 1, 2, 2, 3, 0.95F}}) {
    ++seed;
    run(judge, "hostile-" + std::to_string(seed), hostile_signal(seed, 100000, sentence), with,
        Caller(seed));
    run_explained(judge, "reasons-" + std::to_string(seed + 6),
                  hostile_signal(seed + 6, 60000, sentence), with);
  }
}

}  // namespace
}  // namespace orvalis::test
