// The fixed-point FFT of both families: one body over a set of tables.
// Source: TIA IS-127 (EVRC). Layout and scaling: fixed_fft.h.
#pragma once

#include "Voice_Engine/basic_op/fft.h"
#include "Voice_Engine/basic_op/flags.h"

namespace orvalis {

/// Size and tables of one transform.
struct TransformPlan {
  Word32 size;             ///< N, the number of 16-bit values in the buffer
  Word32 stages;           ///< log2(N / 2)
  const Word16 *twiddles;  ///< N values: cos, -sin in Q15
  const Word16 *steps;     ///< twiddle step of each stage
};

extern const TransformPlan kWideTransform;         ///< of the detector: 256 values
extern const TransformPlan kNarrowTransform;       ///< of the detector: 128 values
extern const TransformPlan kSuppressionTransform;  ///< of the suppressor: 256 values

/// The detector's plan: band 0 is wide, any other narrow.
inline const TransformPlan &epd_transform_plan(Word32 band) {
  return band == 0 ? kWideTransform : kNarrowTransform;
}

/// In-place complex transform of plan.size / 2 points.
void complex_fft(Flags &flags, Word16 *x, Direction direction, const TransformPlan &plan);

/// In-place real transform of plan.size samples.
void real_fft(Flags &flags, Word16 *x, Direction direction, const TransformPlan &plan);

}  // namespace orvalis
