// Real recordings whose level jumps by 12 dB, so that the block shift of a frame and the scale of
// its memories keep changing.
#pragma once

#include <algorithm>
#include <cmath>

#include "tests/support/recordings.h"

namespace orvalis::test {

/// A recording in stretches at its own level, four times (saturated), its own, a quarter; then a
/// tone that fades from full scale, where 32 bits cannot hold its energy.
inline Pcm with_level_jumps(Pcm samples, std::size_t stretch) {
  constexpr double kGains[] = {1, 4, 1, 0.25};
  for (std::size_t i = 0; i < samples.size(); ++i) {
    const double scaled = kGains[i / stretch % 4] * samples[i];
    samples[i] = static_cast<std::int16_t>(std::clamp(scaled, -32768.0, 32767.0));
  }
  for (std::size_t i = 0; i < stretch; ++i) {
    const auto at = static_cast<double>(i);
    const double tone =
        32767 * std::exp(-7 * at / static_cast<double>(stretch)) * std::sin(1.2 * at);
    samples.push_back(static_cast<std::int16_t>(tone));
  }
  return samples;
}

}  // namespace orvalis::test
