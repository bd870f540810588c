// The two-microphone suppressor against the method in double precision, frame by frame from the
// suppressor's own state.
#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <cmath>
#include <complex>
#include <memory>
#include <numbers>
#include <vector>

#include "Voice_Engine/ns/s2chns.h"
#include "tests/support/noise.h"

namespace orvalis::test {
namespace {

constexpr int kBins = 256;
constexpr int kSize = 512;
using Value = std::complex<double>;
using Spectra = std::vector<Value>;
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

const Value &root(int k) {
  static const Spectra roots = [] {
    Spectra all;
    for (int i = 0; i < kSize; ++i)
      all.push_back(std::polar(1.0, -2 * std::numbers::pi * i / kSize));
    return all;
  }();
  return roots[k % kSize];
}

double window(int i) { return std::abs(std::sin((i - 0.5) * std::numbers::pi / 320)); }

/// Spectrum over 256 of 320 samples; bin 0 is DC + i Nyquist.
Spectra spectrum_of(const Reals &samples) {
  Spectra bins(kBins);
  for (int i = 0; i < 320; ++i) {
    for (int k = 1; k < kBins; ++k) bins[k] += samples[i] * root(k * i) / 256.0;
    bins[0] += Value(samples[i], i % 2 ? -samples[i] : samples[i]) / 256.0;
  }
  return bins;
}

Reals samples_of(const Spectra &bins) {
  Reals samples(320);
  for (int i = 0; i < 320; ++i) {
    samples[i] = (bins[0].real() + (i % 2 ? -1 : 1) * bins[0].imag()) / 2;
    for (int k = 1; k < kBins; ++k) samples[i] += std::real(bins[k] * std::conj(root(k * i)));
  }
  return samples;
}

struct Model {
  explicit Model(const S2chnsState &state)
      : tail(std::begin(state.overlap_tail), std::end(state.overlap_tail)),
        presence(std::begin(state.spp_prev), std::end(state.spp_prev)),
        frames(state.frame_count) {
    for (int c = 0; c < 2; ++c)
      history[c].assign(std::begin(state.frame_history[c]), std::end(state.frame_history[c]));
    for (int i = 0; i < 4 * kBins; ++i) {
      input[i / 4][i % 4] = {state.Phi_yy.re[i], state.Phi_yy.im[i]};
      noise[i / 4][i % 4] = {state.Phi_vv.re[i], state.Phi_vv.im[i]};
    }
  }

  /// Processes 160 pairs; the output before it is truncated to integers.
  Reals process(const Word16 *pairs) {
    std::array<Spectra, 2> Y;
    for (int c = 0; c < 2; ++c) {
      Reals frame = history[c];
      for (int i = 0; i < 160; ++i) frame.push_back(pairs[2 * i + c]);
      history[c].assign(frame.begin() + 160, frame.end());
      for (int i = 0; i < 320; ++i) frame[i] *= window(i);
      Y[c] = spectrum_of(frame);
    }
    for (int k = 0; k < kBins; ++k) {
      y[k] = {Y[0][k], Y[1][k]};
      for (int i = 0; i < 4; ++i) outer[k][i] = y[k][i / 2] * std::conj(y[k][i % 2]);
    }
    Spectra out(kBins);
    if (frames < 11) {
      const double keep = frames == 0 ? 0 : 0.61;
      for (int k = 0; k < kBins; ++k) {
        smooth(input[k], keep, outer[k]);
        smooth(noise[k], keep, outer[k]);
        presence[k] = 0;
        out[k] = 0.2 * y[k][0];
      }
    } else {
      for (int k = 0; k < kBins; ++k) smooth(input[k], 0.61, outer[k]);
      const Reals before = presence;
      update_presence();
      for (int k = 0; k < kBins; ++k) presence[k] = 0.6 * before[k] + 0.4 * presence[k];
      learn();
      update_presence();
      learn();
      for (int k = 2; k < kBins; ++k) out[k] = filtered(k);
    }
    ++frames;
    Reals samples = samples_of(out);
    for (int i = 0; i < 320; ++i) samples[i] *= window(i);
    for (int i = 0; i < 160; ++i) samples[i] += tail[i];
    tail.assign(samples.begin() + 160, samples.end());
    samples.resize(160);
    return samples;
  }

  static void smooth(Matrix2 &mean, double keep, const Matrix2 &now) {
    for (int i = 0; i < 4; ++i) mean[i] = keep * mean[i] + (1 - keep) * now[i];
  }

  void learn() {
    for (int k = 0; k < kBins; ++k) smooth(noise[k], 0.92 + 0.08 * presence[k], outer[k]);
  }

  /// Probability that a bin holds speech.
  void update_presence() {
    Reals gamma(kBins), r(kBins), beta(kBins);
    double sum = 0;
    for (int k = 0; k < kBins; ++k) {
      const Matrix2 inverse = inverse_of(noise[k]);
      const Matrix2 ratio = inverse * input[k];
      Matrix2 speech = input[k];
      for (int i = 0; i < 4; ++i) speech[i] -= noise[k][i];
      gamma[k] = form(y[k], inverse);
      r[k] = std::real(ratio[0] + ratio[3]);
      beta[k] = form(y[k], inverse * speech * inverse);
      sum += gamma[k];
    }
    const bool global = sum / kBins < 5.2;
    for (int k = 0; k < kBins; ++k) {
      double local = 0;
      const int first = std::max(0, k - 15);
      for (int i = first; i <= std::min(k + 15, kBins - 1); ++i) local += gamma[i];
      const bool around = local / (k + 16 - first) < 5.2;
      const double own = gamma[k] < 5.2 ? std::clamp((23.1 - r[k]) / (23.1 - 2), 0.0, 1.0) : 0;
      const double q = global && around ? std::clamp(own, 0.01, 0.99) : 0.01;
      const double xi = r[k] - 2;
      const double e = std::exp(std::clamp(-beta[k] / (1 + xi), -10.0, 10.0));
      const double p = 1 / (1 + q / (1 - q) * (1 + xi) * e);
      presence[k] = 1 + xi == 0 ? 1 : std::isnan(p) ? 0 : std::clamp(p, 0.0, 1.0);
    }
  }

  /// What the filter leaves of the first microphone.
  Value filtered(int k) const {
    Matrix2 m = inverse_of(noise[k]) * input[k];
    const Value d = 3.0 + m[0] + m[3] - 2.0;
    const Value scale = std::conj(d) / (std::norm(d) + 1);
    const Value z = std::conj((m[0] - 1.0) * scale) * y[k][0] + std::conj(m[2] * scale) * y[k][1];
    const double loudest = std::abs(y[k][0]);
    if (loudest == 0 || std::isnan(std::abs(z))) return y[k][0];
    return y[k][0] / loudest * std::clamp(std::abs(z), 0.2 * loudest, loudest);
  }

  Reals history[2], tail, presence;
  int frames;
  std::array<Matrix2, kBins> input{}, noise{}, outer{};
  std::array<Vector2, kBins> y{};
};

/// Speech that reaches the second microphone later and weaker, noise from elsewhere, and noise of
/// each microphone's own.
Pcm mixture() {
  Pcm speech(16000);
  for (int i : {0, 1}) {
    const Pcm sentence = speech_16k(kSentences[i]);
    speech.insert(speech.end(), sentence.begin(), sentence.end());
  }
  speech.resize(speech.size() / 160 * 160);
  const std::size_t n = speech.size();
  const auto far = unit_noise(n + 5, NoiseColour::kPink, 1);
  const auto own0 = unit_noise(n, NoiseColour::kWhite, 2),
             own1 = unit_noise(n, NoiseColour::kWhite, 3);
  Pcm pairs;
  for (std::size_t i = 0; i < n; ++i) {
    pairs.push_back(to_sample(0.7 * speech[i] + 200 * far[i] + 100 * own0[i]));
    pairs.push_back(
        to_sample(0.5 * (i < 3 ? 0 : speech[i - 3]) + 150 * far[i + 5] + 100 * own1[i]));
  }
  return pairs;
}

struct Errors {
  double input = 0, noise = 0;  ///< of a covariance, relative to its trace
  double presence = 0;
  double tail = 0;    ///< of a sample, before truncation
  double output = 0;  ///< and after
};

void worsen(double &worst, double error) {
  worst = std::max(worst, std::isnan(error) ? HUGE_VAL : error);
}

double distance(const Matrices &engine, int k, const Matrix2 &model) {
  double error = 0;
  for (int i = 0; i < 4; ++i)
    worsen(error, std::abs(model[i] - Value(engine.re[4 * k + i], engine.im[4 * k + i])));
  return error / std::abs(model[0] + model[3]);
}

/// The worst of all frames; each starts the model from the engine's state.
Errors follow(S2chnsState &state, const Pcm &pairs) {
  Errors errors;
  Pcm out(320);
  for (std::size_t at = 0; at + 320 <= pairs.size(); at += 320) {
    Model model(state);
    const Reals expected = model.process(&pairs[at]);
    EXPECT_EQ(S2CHNSProcessNSFrame(state, &pairs[at], out.data(), 160), 0);
    for (int k = 0; k < kBins; ++k) {
      worsen(errors.input, distance(state.Phi_yy, k, model.input[k]));
      worsen(errors.noise, distance(state.Phi_vv, k, model.noise[k]));
      worsen(errors.presence, std::abs(model.presence[k] - state.spp_prev[k]));
      worsen(errors.presence, std::abs(model.presence[k] - state.spp_smoothed[k]));
    }
    for (int i = 0; i < 160; ++i) {
      worsen(errors.tail, std::abs(model.tail[i] - state.overlap_tail[i]));
      worsen(errors.output, std::abs(expected[i] - out[2 * i]));
      EXPECT_EQ(out[2 * i], out[2 * i + 1]);
      for (int c = 0; c < 2; ++c) EXPECT_EQ(state.frame_history[c][i], model.history[c][i]);
    }
    EXPECT_EQ(state.frame_count, model.frames);
    if (testing::Test::HasFailure()) break;
  }
  return errors;
}

TEST(S2chns, FollowsTheModelFrameByFrame) {
  const auto state = std::make_unique<S2chnsState>();
  const Errors errors = follow(*state, mixture());
  EXPECT_LT(errors.input, 5e-5);
  EXPECT_LT(errors.noise, 1e-4);
  EXPECT_LT(errors.presence, 2e-3);
  EXPECT_LT(errors.tail, 0.1);
  EXPECT_LT(errors.output, 2);
}

TEST(S2chns, PassesTheFirstMicrophoneWhenTheSecondIsDead) {
  const auto state = std::make_unique<S2chnsState>();
  Pcm pairs = mixture();
  for (std::size_t i = 1; i < pairs.size(); i += 2) pairs[i] = 0;
  const Errors errors = follow(*state, pairs);
  EXPECT_LT(errors.input, 5e-5);
  EXPECT_LT(errors.noise, 5e-5);
  EXPECT_EQ(errors.presence, 0);
  EXPECT_LT(errors.output, 2);
}

}  // namespace
}  // namespace orvalis::test
