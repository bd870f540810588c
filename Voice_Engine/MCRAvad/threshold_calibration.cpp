#include "Voice_Engine/MCRAvad/threshold_calibration.h"

#include <algorithm>
#include <cmath>

#include "Voice_Engine/basic_op/word.h"

namespace orvalis {
namespace {

constexpr Word32 kWindowFrames = 90;
constexpr Word32 kWindowStep = 25;
constexpr Word32 kHalfWindow = 45;
constexpr Word32 kLastPhase = 6;
constexpr Word32 kFramesToFinalThreshold = 400;
constexpr Word32 kFramesToEnd = 500;

/// 2 x^(power / ln 10) / (2^31 - 1) with x the mean energy of a frame in the loudest window.
float threshold_of(float loudest_window, double power) {
  const double mean_q31 = loudest_window * 2147483648.0 / kWindowFrames;
  return static_cast<float>(2 * std::exp(power * std::log10(mean_q31)) / 2147483647.0);
}

/// An exponent as a factor of log10; 2.3 stands for ln 10.
double power_of(float exponent) { return exponent * 2.3; }

void close_window(VADINFO &vad, bool is_first, float exponent) {
  const float older = vad.calibrationOlderSum;
  const float newer = vad.calibrationNewerSum;
  vad.calibrationPeak = std::max(is_first ? older : vad.calibrationPeak, newer);
  vad.calibrationBest = std::max(older + newer, vad.calibrationBest);
  vad.calibrationOlderSum = newer;
  vad.calibrationNewerSum = 0;
  vad.energyThreshold = threshold_of(vad.calibrationBest, power_of(exponent));
}

/// Adds a frame to the older or the newer half of its window. All windows but the first have their
/// older half from the previous window.
void add_frame(VADINFO &vad, Word32 base, float frame_energy) {
  const Word32 position = vad.calibrationIndex - base;
  if (vad.calibrationPhase == 0 && position <= kHalfWindow) {
    vad.calibrationOlderSum += frame_energy;
  } else if (position >= kHalfWindow) {
    vad.calibrationNewerSum += frame_energy;
  }
}

void advance_window(VADINFO &vad, float frame_energy, float exponent) {
  const Word32 phase = vad.calibrationPhase;
  if (phase < 0 || phase > kLastPhase) return;
  const Word32 base = kWindowStep * phase;
  const Word32 end = base + kWindowFrames;
  // The seventh window counts no frame and so never reaches its end: the threshold stays.
  if (phase < kLastPhase && vad.calibrationIndex >= base && vad.calibrationIndex <= end) {
    ++vad.calibrationIndex;
    add_frame(vad, base, frame_energy);
  }
  if (vad.calibrationIndex != end) return;
  ++vad.calibrationPhase;
  close_window(vad, phase == 0, exponent);
}

}  // namespace

void calibrate_threshold(VADINFO &vad, float frame_energy, float exponent) {
  constexpr float kMaxExponent = 0.84F;
  count_up(vad.calibrationCount);
  advance_window(vad, frame_energy, exponent);
  if (vad.calibrationCount == kFramesToFinalThreshold)
    vad.energyThreshold =
        threshold_of(vad.calibrationBest, power_of(std::min(kMaxExponent, exponent)));
  if (vad.calibrationCount == kFramesToEnd) vad.calibrationDone = 1;
}

}  // namespace orvalis
