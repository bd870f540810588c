// The two-microphone suppressor against the method in double precision, frame by frame from the
// suppressor's own state.
#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <cmath>
#include <memory>

#include "Voice_Engine/ns/s2chns.h"
#include "tests/support/fourier.h"
#include "tests/support/noise.h"

namespace orvalis::test {
namespace {

constexpr int kBins = 256;
using Value = std::complex<double>;
using Reals = std::vector<double>;
using Matrix2 = std::array<Value, 4>;  // row by row
using Vector2 = std::array<Value, 2>;

Matrix2 operator*(const Matrix2 &a, const Matrix2 &b) {
  return {a[0] * b[0] + a[1] * b[2], a[0] * b[1] + a[1] * b[3], a[2] * b[0] + a[3] * b[2],
          a[2] * b[1] + a[3] * b[3]};
}

Matrix2 inverse_of(const Matrix2 &a) {
  const Value det = a[0] * a[3] - a[1] * a[2];
  Matrix2 adjugate = {a[3], -a[1], -a[2], a[0]};
  // So that 0 / 0 is not a number in both parts.
  for (Value &value : adjugate) value = value * std::conj(det) / std::norm(det);
  return adjugate;
}

/// y^H a y, real part.
double form(const Vector2 &y, const Matrix2 &a) {
  return std::real(std::conj(y[0]) * (a[0] * y[0] + a[1] * y[1]) +
                   std::conj(y[1]) * (a[2] * y[0] + a[3] * y[1]));
}

void smooth(Matrix2 &mean, double keep, const Matrix2 &now) {
  for (int i = 0; i < 4; ++i) mean[i] = keep * mean[i] + (1 - keep) * now[i];
}

double window(int i) { return std::abs(std::sin((i - 0.5) * std::numbers::pi / 320)); }

Matrix2 element(const Matrices &engine, int k) {
  Matrix2 matrix;
  for (int i = 0; i < 4; ++i) matrix[i] = {engine.re[4 * k + i], engine.im[4 * k + i]};
  return matrix;
}

struct Model {
  explicit Model(const S2chnsState &from) : state(from) {
    for (int k = 0; k < kBins; ++k) {
      input[k] = element(state.Phi_yy, k);
      noise[k] = element(state.Phi_vv, k);
      presence[k] = state.spp_prev[k];
    }
  }

  /// Processes 160 pairs once the first frames are over; the output before it is truncated.
  Reals process(const Word16 *pairs) {
    Spectrum Y[2];
    for (int c = 0; c < 2; ++c) {
      Reals frame(512);
      for (int i = 0; i < 320; ++i)
        frame[i] = window(i) * (i < 160 ? state.frame_history[c][i] : pairs[2 * (i - 160) + c]);
      Y[c] = packed_bins(frame);
    }
    for (int k = 0; k < kBins; ++k) {
      y[k] = {Y[0][k], Y[1][k]};
      for (int i = 0; i < 4; ++i) outer[k][i] = y[k][i / 2] * std::conj(y[k][i % 2]);
      smooth(input[k], 0.61, outer[k]);
    }
    const auto before = presence;
    update_presence();
    for (int k = 0; k < kBins; ++k) presence[k] = 0.6 * before[k] + 0.4 * presence[k];
    learn();
    update_presence();
    learn();
    Spectrum out(kBins);
    for (int k = 2; k < kBins; ++k) out[k] = filtered(k);
    Reals samples = unpacked_samples(out);
    for (int i = 0; i < 320; ++i)
      samples[i] = window(i) * samples[i] + (i < 160 ? state.overlap_tail[i] : 0);
    return samples;
  }

  void learn() {
    for (int k = 0; k < kBins; ++k) smooth(noise[k], 0.92 + 0.08 * presence[k], outer[k]);
  }

  /// Probability that a bin holds speech.
  void update_presence() {
    Reals gamma(kBins), r(kBins), beta(kBins);
    double sum = 0;
    for (int k = 0; k < kBins; ++k) {
      const Matrix2 inverse = inverse_of(noise[k]), ratio = inverse * input[k];
      Matrix2 speech = input[k];
      for (int i = 0; i < 4; ++i) speech[i] -= noise[k][i];
      gamma[k] = form(y[k], inverse);
      r[k] = std::real(ratio[0] + ratio[3]);
      beta[k] = form(y[k], inverse * speech * inverse);
      sum += gamma[k];
    }
    for (int k = 0; k < kBins; ++k) {
      double local = 0;
      const int first = std::max(0, k - 15);
      for (int i = first; i <= std::min(k + 15, kBins - 1); ++i) local += gamma[i];
      const bool quiet = sum / kBins < 5.2 && local / (k + 16 - first) < 5.2 && gamma[k] < 5.2;
      const double q = quiet ? std::clamp((23.1 - r[k]) / (23.1 - 2), 0.01, 0.99) : 0.01;
      const double xi = r[k] - 2;
      const double e = std::exp(std::clamp(-beta[k] / (1 + xi), -10.0, 10.0));
      const double p = 1 / (1 + q / (1 - q) * (1 + xi) * e);
      presence[k] = std::isnan(p) ? 0 : std::clamp(p, 0.0, 1.0);
    }
  }

  /// What the filter leaves of the first microphone.
  Value filtered(int k) const {
    const Matrix2 m = inverse_of(noise[k]) * input[k];
    const Value d = 3.0 + m[0] + m[3] - 2.0, scale = std::conj(d) / (std::norm(d) + 1);
    const Value z = std::conj((m[0] - 1.0) * scale) * y[k][0] + std::conj(m[2] * scale) * y[k][1];
    const double loudest = std::abs(y[k][0]);
    if (loudest == 0 || std::isnan(std::abs(z))) return y[k][0];
    return y[k][0] / loudest * std::clamp(std::abs(z), 0.2 * loudest, loudest);
  }

  S2chnsState state;
  std::array<Matrix2, kBins> input, noise, outer;
  std::array<Vector2, kBins> y;
  std::array<double, kBins> presence;
};

/// Speech that reaches the second microphone later and weaker, noise from elsewhere, and noise of
/// each microphone's own.
Pcm mixture() {
  const Pcm speech = in_noise(speech_16k(kSentences[0]), 16000, NoiseColour::kPink, 0);
  const std::size_t n = speech.size() / 160 * 160;
  const auto far = unit_noise(n + 5, NoiseColour::kPink, 1);
  const auto own0 = unit_noise(n, NoiseColour::kWhite, 2);
  const auto own1 = unit_noise(n, NoiseColour::kWhite, 3);
  Pcm pairs;
  for (std::size_t i = 0; i < n; ++i) {
    pairs.push_back(to_sample(0.7 * speech[i] + 200 * far[i] + 100 * own0[i]));
    pairs.push_back(
        to_sample(0.5 * (i < 3 ? 0 : speech[i - 3]) + 150 * far[i + 5] + 100 * own1[i]));
  }
  return pairs;
}

/// Of a covariance relative to its trace; a not-a-number counts as infinite.
double distance(const Matrix2 &engine, const Matrix2 &model) {
  double error = 0;
  for (int i = 0; i < 4; ++i) error += std::abs(model[i] - engine[i]);
  error /= std::abs(model[0] + model[3]);
  return std::isnan(error) ? HUGE_VAL : error;
}

TEST(TwoMicrophones, FollowTheModelFrameByFrame) {
  for (const bool second_is_dead : {false, true}) {
    const auto state = std::make_unique<S2chnsState>();
    Pcm pairs = mixture(), out(320);
    for (std::size_t i = 1; second_is_dead && i < pairs.size(); i += 2) pairs[i] = 0;
    for (std::size_t at = 0; at + 320 <= pairs.size(); at += 320) {
      const auto model = std::make_unique<Model>(*state);
      EXPECT_EQ(S2CHNSProcessNSFrame(*state, &pairs[at], out.data(), 160), 0);
      if (at < 12 * 320) continue;
      const Reals expected = model->process(&pairs[at]);
      for (int k = 0; k < kBins; ++k) {
        ASSERT_LT(distance(element(state->Phi_yy, k), model->input[k]), 1e-4) << k;
        ASSERT_LT(distance(element(state->Phi_vv, k), model->noise[k]), 2e-4) << k;
        ASSERT_NEAR(state->spp_prev[k], model->presence[k], second_is_dead ? 0 : 2e-3) << k;
      }
      for (int i = 0; i < 160; ++i) {
        ASSERT_NEAR(expected[i], out[2 * i], 2);
        ASSERT_NEAR(expected[i + 160], state->overlap_tail[i], 0.1);
        ASSERT_EQ(out[2 * i], out[2 * i + 1]);
      }
    }
  }
}

}  // namespace
}  // namespace orvalis::test
