// The MCRA detector: any configuration, exponent, length of window, reset and audio.
#include <algorithm>
#include <bit>
#include <memory>

#include "Voice_Engine/MCRAvad/MCRAvad.h"
#include "fuzz/input.h"
#include "jni/orvalis.h"

namespace {

using orvalis::fuzz::Input;
using orvalis::fuzz::require;
using orvalis::fuzz::Samples;

constexpr std::size_t kMaxSamples = 16000;
constexpr std::size_t kMaxCalibrated = 96000;  // a calibration takes 93000

void configure(VADINFO &vad, Input &input) {
  vad.historyUpdate = input.number();
  vad.calibrationMode = input.number();
  vad.calibrationEnable = input.number();
  vad.lowThresholdSelect = input.number();
  vad.energyMargin = input.number();
}

void require_invariants(const VADINFO &vad, std::int32_t decision) {
  require(decision == 0 || decision == 1, "a decision is 0 or 1");
  require(decision == 0 || vad.frameIndex > 0, "the first frame is not speech");
  require(vad.frameSnr >= 0, "the frame's SNR is not negative");
  require(vad.calibrationPhase >= 0 && vad.calibrationPhase <= 6, "the last phase is 6");
  require(vad.calibrationIndex <= 215, "the calibration ends at 215");
  for (int k = 0; k < MCRA_BINS; ++k) {
    require(vad.periodogram[k] >= 0 && vad.periodogram[k] < INT64_C(1) << 45, "a power is bounded");
    require(vad.smoothedPeriodogram[k] < INT64_C(1) << 47, "a smoothed power is bounded");
    require(vad.minPower[k] >= 21474, "minima have a floor");
    require(vad.noisePower[k] >= 0 && vad.noisePower[k] < INT64_C(1) << 47, "noise is bounded");
    require(vad.noiseSmoothing[k] >= 2145336163, "noise keeps 0.999");
    require(vad.prioriSnr[k] >= 1, "an a priori SNR is never 0");
    require(vad.gain[k] >= 0 && vad.gain[k] < 1 << 21, "a gain is bounded");
    require(vad.speechProb[k] == 0 || vad.speechProb[k] > 109521665,
            "negligible probabilities are 0");
  }
  require(std::count(std::begin(vad.reserved), std::end(vad.reserved), 0) == 80, "reserved is 0");
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t *bytes, std::size_t size) {
  SetLogSink(LogNothing, nullptr);
  Input input(bytes, size);
  const auto record = std::make_unique<VADINFO>();
  VADINFO *vad = record.get();
  initialVADINFO(&vad);
  configure(*vad, input);

  // Few sessions are long, so that many are run.
  const std::size_t max_samples = vad->calibrationEnable == 1 ? kMaxCalibrated : kMaxSamples;
  for (std::size_t pushed = 0; !input.is_empty() && pushed < max_samples;) {
    const std::uint8_t call = input.byte() % 8;
    if (call == 0) {
      reset_MCRA_params(&vad);
    } else if (call == 1) {
      initialVADINFO(&vad);
    } else if (call == 2) {
      configure(*vad, input);
    } else if (call == 3) {
      Samples frame = input.audio();
      frame.resize(MCRA_FRAME_SAMPLES);
      ApplyVAD(&vad, frame.data(), input.number());
    } else {
      const std::int32_t length = input.number(), exponent = input.number();
      const Samples audio = input.audio();
      pushed += audio.size();
      for (std::size_t at = 0; at + MCRA_FRAME_SAMPLES <= audio.size(); at += MCRA_FRAME_SAMPLES) {
        // Without spare capacity, so that reading or writing beyond it is noticed.
        Samples frame(&audio[at], &audio[at] + MCRA_FRAME_SAMPLES);
        const std::int32_t index = vad->frameIndex;
        // Mostly hundredths, and now and then any 32 bits.
        const float power = exponent >= 0 && exponent < 255 ? static_cast<float>(exponent) / 100
                                                            : std::bit_cast<float>(exponent);
        require_invariants(*vad, processVAD(&vad, frame.data(), length, power));
        require(vad->frameIndex == index + 1, "frames are counted");
      }
    }
  }
  return 0;
}
