// Two-microphone noise suppressor: 16 kHz, frames of 160 samples a channel.
//
// Tracks the 2x2 spatial covariances of input and noise and the probability of speech in each
// frequency bin, and filters both channels to one by a parametric multichannel Wiener filter
// (PMWF). The output is delayed by 160 samples.
//
// Source: M. Souden, J. Chen, J. Benesty, S. Affes, "Gaussian model-based multichannel speech
// presence probability", 2010, and "An integrated solution for online multichannel noise tracking
// and reduction", 2011. Symbols are theirs: Y input, Phi_yy, Phi_xx, Phi_vv covariances of input,
// speech and noise, xi a priori SNR, gamma and beta quadratic forms of Y, q prior probability of
// speech absence, p probability of speech.
//
// No input makes a covariance infinite or not a number. A dead microphone, or the same signal on
// both, makes the noise covariance singular; the suppressor recovers when the microphone does.
#pragma once

#include "Voice_Engine/basic_op/word.h"
#include "Voice_Engine/ns/complex_matrix.h"

namespace orvalis {

inline constexpr int kHop = 160;          ///< samples a channel and frame
inline constexpr int kWindow = 2 * kHop;  ///< samples under the window
inline constexpr int kWarmUpFrames = 11;  ///< initial frames, which all count as noise

/// State of one suppressor, all zero before the first frame.
struct S2chnsState {
  float frame_history[2][kHop];        ///< the previous frame of each channel
  float overlap_tail[kHop];            ///< second half of the previous windowed output
  Matrices Phi_yy;                     ///< covariance of the input
  Matrices Phi_vv;                     ///< covariance of the noise
  float spp_smoothed[kTransformBins];  ///< p of this frame
  float spp_prev[kTransformBins];      ///< p with which that of the next frame is smoothed
  Word32 frame_count;                  ///< frames processed; saturates
};

/// Clears everything: the next 11 frames count as noise again.
void S2CHNSInit(S2chnsState &state);

/// Suppresses n samples a channel, n a multiple of 160: interleaved pairs in and out, both channels
/// of the output the same. Output frame j begins at element 160 j and is 320 long, so that of
/// several frames each but the last keeps only its first half. A frame whose mean magnitude in
/// channel 0 is below 10 leaves output and state as they are. Samples beyond 16 bits wrap around.
/// Returns 0, or -100 for any other n; nothing happens for n < 1.
Word32 S2CHNSProcessNSFrame(S2chnsState &state, const Word16 *in, Word16 *out, Word16 n);

/// The two bodies behind S2CHNSProcessNSFrame, for one frame; the second needs has_fma().
void s2chns_frame_portable(S2chnsState &state, const Word16 *in, Word16 *out);
void s2chns_frame_fused(S2chnsState &state, const Word16 *in, Word16 *out);

/// Releases nothing, for a suppressor owns nothing. Returns 0.
Word32 S2CHNSFree();

/// exp(x), held between exp(-10) and exp(10).
float SAFE_EXP(float x);

/// A probability held between 0 and 1.
float SAFE_SAP(float x);

/// Copies, or clears, `count` floats; nothing for count < 1.
void buffercopy(const float *src, float *dst, Word16 count);
void bufferreset(float *buf, Word16 count);

}  // namespace orvalis
