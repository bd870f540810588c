#include "Voice_Engine/ns/s2chns.h"

#include <algorithm>
#include <cmath>
#include <cstdlib>
#include <cstring>

#include "Voice_Engine/basic_op/constexpr_math.h"

namespace orvalis {
namespace {

// The time constant of a smoothing factor alpha is -10 ms / ln(alpha).
constexpr double cov_smoothing = 0.61;  // alpha of Phi_yy: 20 ms
constexpr double kAlphaV = 0.92;        // alpha of Phi_vv where p is 0: 120 ms
constexpr double kAlphaP = 0.6;         // alpha of p: 20 ms

constexpr float pmwf_beta = 3.0;      // of the filter: trades distortion for suppression
constexpr float output_gain = 0.2F;   // the filter lowers a bin by 14 dB at most
constexpr int kReach = 15;            // bins to either side in the local average
constexpr int kMinMagnitudes = 1600;  // a mean magnitude of 10 in channel 0
constexpr Word32 kBadLength = -100;

// Thresholds of the decisions whose product is q. From snr_low_threshold on, gamma or its mean
// rules noise alone out (of Gaussian noise with a known covariance, 3.4 % of the bins reach it).
// Below, snr_high_threshold is the trace of Phi_vv^-1 Phi_yy from which on a bin holds speech for
// sure.
constexpr double snr_low_threshold = 5.2;
constexpr double snr_high_threshold = 23.1;

/// Square-root Hann window. Its index lags by one, so that the first two entries are the same.
constexpr std::array<float, kWindow> make_sqrt_hann_window() {
  constexpr double kPi = 3.1415926535;  // ten digits on purpose: results are bit-exact to them
  std::array<float, kWindow> window{};
  for (int k = 0; k < kWindow; ++k) {
    const double sine = constexpr_math::sin_of((k - 0.5) * kPi / kWindow);
    window[k] = static_cast<float>(constexpr_math::sqrt_of(static_cast<float>(sine * sine)));
  }
  return window;
}

constexpr auto sqrt_hann_window = make_sqrt_hann_window();

ORVALIS_KERNEL float smoothed(double alpha, float past, float present) {
  return static_cast<float>(alpha * past + (1.0 - alpha) * present);
}

ORVALIS_KERNEL void smooth(Matrices &covariance, int bin, double alpha, const Matrices &present) {
  for (int i = 4 * bin; i < 4 * bin + 4; ++i) {
    covariance.re[i] = smoothed(alpha, covariance.re[i], present.re[i]);
    covariance.im[i] = smoothed(alpha, covariance.im[i], present.im[i]);
  }
}

/// Both channels of a frame.
struct Spectra {
  Spectrum first, second;
  Matrices YY;  ///< Y Y^H

  ORVALIS_KERNEL Pair Y(int bin) const { return {first[bin], second[bin]}; }
};

/// The statistics of each bin on which the probability of speech depends.
struct Statistics {
  float gamma[kTransformBins];  ///< a posteriori SNR: Y^H Phi_vv^-1 Y
  float trace[kTransformBins];  ///< of Phi_vv^-1 Phi_yy: 2 above the a priori SNR xi
  float beta[kTransformBins];   ///< Y^H Phi_vv^-1 Phi_xx Phi_vv^-1 Y
};

/// The spectrum of a channel's previous and new frame under the window. Keeps the new frame as the
/// previous one.
ORVALIS_KERNEL Spectrum analyse(float *frame_history, const float *frame) {
  float analysis_frame[kTransformSamples];
  buffercopy(frame_history, analysis_frame, kHop);
  buffercopy(frame, analysis_frame + kHop, kHop);
  bufferreset(analysis_frame + kWindow, kTransformSamples - kWindow);
  buffercopy(frame, frame_history, kHop);
  for (int i = 0; i < kWindow; ++i) analysis_frame[i] *= sqrt_hann_window[i];
  Spectrum spectrum;
  std::memcpy(spectrum.data(), analysis_frame, sizeof spectrum);
  real_transform(spectrum, Direction::kForward);
  return spectrum;
}

/// 16 bits of a sample: truncated toward zero to 32 bits, of which the low half is kept.
Word16 to_word16(float sample) {
  constexpr float kBeyond = 2147483648.0F;
  if (std::isnan(sample)) return 0;
  if (sample >= kBeyond) return static_cast<Word16>(MAX_32);
  return static_cast<Word16>(sample < -kBeyond ? MIN_32 : static_cast<Word32>(sample));
}

/// Overlaps and adds the inverse transform of a spectrum; every sample goes to both channels.
ORVALIS_KERNEL void synthesise(Spectrum &spectrum, float *overlap_tail, Word16 *out) {
  real_transform(spectrum, Direction::kInverse);
  float synthesis_buffer[kTransformSamples];
  std::memcpy(synthesis_buffer, spectrum.data(), sizeof synthesis_buffer);
  for (int i = 0; i < kWindow; ++i) synthesis_buffer[i] *= sqrt_hann_window[i];
  for (int i = 0; i < kHop; ++i)
    out[2 * i] = out[2 * i + 1] = to_word16(synthesis_buffer[i] + overlap_tail[i]);
  buffercopy(synthesis_buffer + kHop, overlap_tail, kHop);
}

/// A bin with the phase of y and the given magnitude.
ORVALIS_KERNEL Bin with_magnitude(Bin y, float magnitude) {
  const Complex<double> wide = widened(y);
  const double own = std::sqrt(wide.re * wide.re + wide.im * wide.im);
  if (own == 0) return {0, 0};
  return rounded({magnitude * wide.re / own, magnitude * wide.im / own});
}

/// An initial frame: it counts as noise, and the output is the first channel at 0.2 of its level.
ORVALIS_KERNEL Spectrum warm_up(S2chnsState &state, const Spectra &frame) {
  if (state.frame_count == 0) state.Phi_yy = state.Phi_vv = frame.YY;
  bufferreset(state.spp_smoothed, kTransformBins);
  bufferreset(state.spp_prev, kTransformBins);

  Spectrum output;
  for (int k = 0; k < kTransformBins; ++k) {
    if (state.frame_count > 0) {
      smooth(state.Phi_yy, k, cov_smoothing, frame.YY);
      smooth(state.Phi_vv, k, cov_smoothing, frame.YY);
    }
    const Bin Y0 = frame.first[k];
    output[k] = with_magnitude(Y0, output_gain * std::sqrt(power(Y0)));
  }
  return output;
}

/// Re(Y^H a Y)
ORVALIS_KERNEL float quadratic_form(const Pair &Y, const Matrix &a) {
  return mul_1by2_2by1_matrix(mul_1by2_2by2_matrix(conj(Y), a), Y).re;
}

/// The statistics for the noise covariance as it stands.
ORVALIS_KERNEL void compute_statistics(const S2chnsState &state, const Spectra &frame,
                                       Statistics &statistics) {
  for (int k = 0; k < kTransformBins; ++k) {
    const Pair Y = frame.Y(k);
    const Matrix Phi_yy = state.Phi_yy.load(k);
    const Matrix Phi_vv = state.Phi_vv.load(k);
    const Matrix Phi_xx = Phi_yy - Phi_vv;
    const Matrix Phi_vv_inv = inv_matrix(Phi_vv);
    const Matrix M = mul_2by2_matrix(Phi_vv_inv, Phi_yy);
    const Matrix N = mul_2by2_matrix(mul_2by2_matrix(Phi_vv_inv, Phi_xx), Phi_vv_inv);
    statistics.gamma[k] = quadratic_form(Y, Phi_vv_inv);
    statistics.trace[k] = M.m11.re + M.m22.re;
    statistics.beta[k] = quadratic_form(Y, N);
  }
}

/// From 1 where a bin by itself looks like noise alone to 0 where it does not.
ORVALIS_KERNEL float local_soft_decision(float trace, float gamma) {
  constexpr double kNoSpeech = 2.0;  // the trace of the identity: xi is 0
  if (!(gamma < snr_low_threshold)) return 0;
  if (trace < kNoSpeech) return 1;
  if (!(trace < snr_high_threshold)) return 0;  // not-a-numbers too
  return static_cast<float>((snr_high_threshold - trace) / (snr_high_threshold - kNoSpeech));
}

/// 1 if the neighbourhood of a bin looks like noise. Bins above the last one count as 0.
ORVALIS_KERNEL float local_averaged_decision(const float *gamma, int bin) {
  const int first = std::max(0, bin - kReach);
  const int beyond = bin + kReach + 1;
  float sum = 0;
  for (int k = first; k < std::min(beyond, kTransformBins); ++k) sum += gamma[k];
  return sum / static_cast<float>(beyond - first) < snr_low_threshold ? 1.0F : 0.0F;
}

/// 1 if the whole frame looks like noise.
ORVALIS_KERNEL float global_decision(const float *gamma) {
  float sum = 0;
  for (int k = 0; k < kTransformBins; ++k) sum += gamma[k];
  return sum * (1.0F / kTransformBins) < snr_low_threshold ? 1.0F : 0.0F;
}

/// p = 1 / (1 + q / (1 - q) (1 + xi) e^(-beta / (1 + xi)))
ORVALIS_KERNEL float presence_probability(float q, float trace, float beta) {
  const double xi = trace - 2.0F;
  if (1.0 + xi == 0) return 1;
  const float e = SAFE_EXP(static_cast<float>(-beta / (1.0 + xi)));
  const auto odds = static_cast<float>(q / (1.0 - q) * (1.0 + xi) * e);
  const auto p = static_cast<float>(1.0 / (1.0 + odds));
  return std::isnan(p) ? 0 : SAFE_SAP(p);
}

ORVALIS_KERNEL void compute_presence(const Statistics &statistics, float *p) {
  constexpr float kMinPrior = 0.01F;
  constexpr float kMaxPrior = 0.99F;
  const auto &[gamma, trace, beta] = statistics;
  const float global = global_decision(gamma);
  for (int k = 0; k < kTransformBins; ++k) {
    const float q =
        global * local_soft_decision(trace[k], gamma[k]) * local_averaged_decision(gamma, k);
    p[k] = presence_probability(std::clamp(q, kMinPrior, kMaxPrior), trace[k], beta[k]);
  }
}

/// Smooths Phi_vv by alpha_v + (1 - alpha_v) p: the likelier speech, the slower.
ORVALIS_KERNEL void update_noise(S2chnsState &state, const Spectra &frame) {
  for (int k = 0; k < kTransformBins; ++k) {
    const double alpha = kAlphaV + (1.0 - kAlphaV) * state.spp_smoothed[k];
    smooth(state.Phi_vv, k, alpha, frame.YY);
  }
}

/// Estimates p and Phi_vv twice: first with p smoothed over time, then anew with the Phi_vv that
/// this gave.
ORVALIS_KERNEL void track(S2chnsState &state, const Spectra &frame) {
  for (int k = 0; k < kTransformBins; ++k) smooth(state.Phi_yy, k, cov_smoothing, frame.YY);

  Statistics statistics;
  float p[kTransformBins];
  compute_statistics(state, frame, statistics);
  compute_presence(statistics, p);
  for (int k = 0; k < kTransformBins; ++k)
    state.spp_smoothed[k] = smoothed(kAlphaP, state.spp_prev[k], p[k]);
  update_noise(state, frame);

  compute_statistics(state, frame, statistics);
  compute_presence(statistics, state.spp_smoothed);
  buffercopy(state.spp_smoothed, state.spp_prev, kTransformBins);
  update_noise(state, frame);
}

/// Filters both channels; the output has the first channel's phase and 0.2 to 1 of its magnitude.
ORVALIS_KERNEL Spectrum filter(const S2chnsState &state, const Spectra &frame) {
  Spectrum output{};  // DC, Nyquist and bin 1 stay silent
  for (int k = 2; k < kTransformBins; ++k) {
    const Pair Y = frame.Y(k);
    const Matrix M = mul_2by2_matrix(inv_matrix(state.Phi_vv.load(k)), state.Phi_yy.load(k));
    const Matrix W = compute_PMWF_coeff(M, pmwf_beta);
    const Bin Z = conj(W.m11) * Y.first + conj(W.m21) * Y.second;
    const float max = std::sqrt(power(Y.first));
    const float filtered = std::sqrt(power(Z));
    const float magnitude = filtered <= max ? filtered : max;  // not-a-numbers too
    output[k] = with_magnitude(Y.first, std::max(magnitude, output_gain * max));
  }
  return output;
}

ORVALIS_KERNEL void process_frame(S2chnsState &state, const Word16 *in, Word16 *out) {
  float frame[2][kHop];
  int magnitudes = 0;
  for (int i = 0; i < kHop; ++i) {
    frame[0][i] = in[2 * i];
    frame[1][i] = in[2 * i + 1];
    magnitudes += std::abs(in[2 * i]);
  }
  if (magnitudes < kMinMagnitudes) return;

  Spectra spectra;
  spectra.first = analyse(state.frame_history[0], frame[0]);
  spectra.second = analyse(state.frame_history[1], frame[1]);
  for (int k = 0; k < kTransformBins; ++k)
    spectra.YY.store(k, mul_2by1_1by2_matrix(spectra.Y(k), conj(spectra.Y(k))));

  Spectrum output;
  if (state.frame_count < kWarmUpFrames) {
    output = warm_up(state, spectra);
  } else {
    track(state, spectra);
    output = filter(state, spectra);
  }
  synthesise(output, state.overlap_tail, out);
  count_up(state.frame_count);
}

}  // namespace

void s2chns_frame_portable(S2chnsState &state, const Word16 *in, Word16 *out) {
  process_frame(state, in, out);
}

ORVALIS_WITH_FMA void s2chns_frame_fused(S2chnsState &state, const Word16 *in, Word16 *out) {
  process_frame(state, in, out);
}

void S2CHNSInit(S2chnsState &state) { std::memset(&state, 0, sizeof state); }

Word32 S2CHNSProcessNSFrame(S2chnsState &state, const Word16 *in, Word16 *out, Word16 n) {
  if (n % kHop != 0) return kBadLength;
  const auto frame = has_fma() ? s2chns_frame_fused : s2chns_frame_portable;
  for (int at = 0; at < n; at += kHop) frame(state, in + 2 * at, out + at);
  return 0;
}

Word32 S2CHNSFree() { return 0; }

float SAFE_EXP(float x) {
  if (x < -10) return 4.539993e-5F;
  if (x > 10) return 22026.465F;
  return static_cast<float>(std::exp(static_cast<double>(x)));
}

float SAFE_SAP(float x) {
  if (x > 1) return 1;
  return x < 0 ? 0 : x;
}

void buffercopy(const float *src, float *dst, Word16 count) {
  if (count > 0) std::copy_n(src, count, dst);
}

void bufferreset(float *buf, Word16 count) {
  if (count > 0) std::fill_n(buf, count, 0.0F);
}

}  // namespace orvalis
