// Floating point as the 16 bits that the engine takes.
#pragma once

#include <algorithm>
#include <cmath>
#include <cstdint>

namespace orvalis::cli {

/// Full scale is 32768; rounded to nearest, clipped.
inline std::int16_t to_word16(float sample) {
  if (std::isnan(sample)) return 0;
  return static_cast<std::int16_t>(std::lrint(std::clamp(sample * 32768.0, -32768.0, 32767.0)));
}

}  // namespace orvalis::cli
