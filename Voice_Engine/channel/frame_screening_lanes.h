// The screening of a frame in lanes. What it does: frame_screening.h.
#pragma once

#include "Voice_Engine/basic_op/lanes.h"
#include "Voice_Engine/channel/frame_screening.h"

namespace orvalis::ORVALIS_BODY {

/// Where zeros abound: sample by sample.
inline bool has_run_of_zeros(const Word16 *frame, int samples, int max_zeros,
                             Word32 &small_samples) {
  int zeros = 0;
  for (int i = 0; i < samples; ++i) {
    if (frame[i] == 0) {
      if (++zeros > max_zeros) return true;
    } else {
      zeros = 0;
      if (frame[i] >= -4 && frame[i] <= 4) count_up(small_samples);
    }
  }
  return false;
}

inline bool is_null_frame(const Word16 *frame, int samples, Word32 &small_samples) {
  using L = Wide;
  constexpr int kMaxZeros = 60;
  Count<L> zeros;
  Count<L> small;
  for (int i = 0; i < samples; i += L::kWidth) {
    const V<L> x = L::load(frame + i);
    zeros.add(L::equal(x, L::broadcast(0)));
    small.add(L::greater(L::broadcast(5), abs_s<L>(x)));
  }
  const int number = zeros.total();
  if (number > kMaxZeros) return has_run_of_zeros(frame, samples, kMaxZeros, small_samples);
  count_up(small_samples, small.total() - number);
  return false;
}

}  // namespace orvalis::ORVALIS_BODY
