// The fixed-point FFT of both families: one body over a set of tables.
// Source: TIA IS-127 (EVRC). Layout and scaling: fixed_fft.h.
#pragma once

#include "Voice_Engine/basic_op/fft.h"
#include "Voice_Engine/basic_op/flags.h"

namespace orvalis {

/// What a pair of mirrored bins k and N/2 - k multiplies its odd parts with, k = 1..N/4: pairs of
/// factors in Q15, for the real and the imaginary part of either bin.
struct SplitFactors {
  const Word16 *low_re;
  const Word16 *low_im;
  const Word16 *high_re;
  const Word16 *high_im;
};

/// Twiddle factors in the order in which vectors of one width read them.
struct LaneFactors {
  // The factors c + j s of the stages, 1, 2 ... N/4 of them one after the other, as pairs of -c and
  // s, and of s and c.
  const Word16 *minus_cos_sin;
  const Word16 *sin_cos;
  // The same of the stage with 8, each one eight times, in bit-reversed order.
  const Word16 *halves_minus_cos_sin;
  const Word16 *halves_sin_cos;
  SplitFactors split[2];  ///< of the forward transform, of the inverse
};

/// Size and tables of one transform.
struct TransformPlan {
  Word32 size;             ///< N, the number of 16-bit values in the buffer
  const Word16 *twiddles;  ///< N values: cos, -sin in Q15
  LaneFactors of_lanes8;
  LaneFactors of_lanes16;  ///< for N = 256
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
