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

/// The plan of the detector's family: band 0 is 256 values, any other 128.
TransformPlan epd_transform_plan(Word32 band);

/// The plan of the suppressor's family: 256 values.
TransformPlan ns_transform_plan();

/// In-place complex transform of plan.size / 2 points.
void complex_fft(Flags &flags, Word16 *x, Direction direction, const TransformPlan &plan);

/// In-place real transform of plan.size samples.
void real_fft(Flags &flags, Word16 *x, Direction direction, const TransformPlan &plan);

}  // namespace orvalis
