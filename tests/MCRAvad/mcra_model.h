// The analysis of the MCRA detector a second time, step by step by its definition, on the exported
// mathematics and with a state of its own.
#pragma once

#include <cstdint>
#include <vector>

#include "Voice_Engine/MCRAvad/MCRAvad.h"

namespace orvalis::test {

class McraModel {
public:
  McraModel() { now_.frameIndex = -1; }

  void analyse(std::vector<std::int16_t> frame, bool keeps_history);

  /// The fields that an analysis writes; the others are 0.
  const VADINFO &state() const { return now_; }

private:
  void noise(bool keeps_history);
  void presence();
  std::int32_t absence(int k) const;

  VADINFO now_{};
  VADINFO before_{};
};

}  // namespace orvalis::test
