// The single-precision transform and the algebra on its bins, against double precision.
#include "Voice_Engine/ns/float_fft.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <cmath>
#include <complex>
#include <numbers>
#include <random>
#include <vector>

#include "Voice_Engine/ns/complex_matrix.h"
#include "tests/support/random.h"

namespace orvalis::test {
namespace {

constexpr int kForward = 1;
constexpr int kInverse = -1;

using Samples = std::vector<float>;
using Wide = std::complex<double>;

/// Error of `got` relative to the root mean square of `expected`.
double relative_error(const std::vector<double> &expected, const Samples &got) {
  double error = 0, energy = 0;
  for (std::size_t i = 0; i < got.size(); ++i) {
    error += std::pow(got[i] - expected[i], 2);
    energy += expected[i] * expected[i];
  }
  return std::sqrt(error / energy);
}

TEST(FloatFft, MatchesTheDiscreteFourierTransform) {
  std::mt19937_64 generator = seeded_generator();
  for (const double scale : {1e-10, 1.0, 32768.0, 1e10}) {
    Samples data(512);
    for (float &x : data)
      x = static_cast<float>(scale * (std::uniform_real_distribution<>(-1, 1)(generator)));
    const auto bin = [&data](int k) {
      Wide sum = 0;
      for (int n = 0; n < 512; ++n)
        sum += double(data[n]) * std::polar(1.0, -2 * std::numbers::pi * (k * n % 512) / 512);
      return sum / 256.0;
    };
    std::vector<double> expected = {bin(0).real(), bin(256).real()};
    for (int k = 1; k < 256; ++k) {
      expected.push_back(bin(k).real());
      expected.push_back(bin(k).imag());
    }
    Samples spectrum = data;
    r_fft(spectrum.data(), kForward);
    EXPECT_LT(relative_error(expected, spectrum), 2e-7) << scale;
    r_fft(spectrum.data(), kInverse);
    EXPECT_LT(relative_error({data.begin(), data.end()}, spectrum), 2e-7) << scale;
    // The complex transform there and back, with any direction but 1 as inverse.
    Samples complex = data;
    EXPECT_EQ(c_fft(complex.data(), kForward), complex.data());
    c_fft(complex.data(), 0);
    EXPECT_LT(relative_error({data.begin(), data.end()}, complex), 2e-7) << scale;
  }
}

TEST(FloatFft, IsExactOnImpulseAndConstant) {
  Samples data(512), expected(512);
  data[0] = 1;
  for (int i = 0; i < 512; ++i) expected[i] = i < 2 || i % 2 == 0 ? 1.0F / 256 : 0;
  r_fft(data.data(), kForward);
  EXPECT_EQ(data, expected);
  r_fft(data.data(), kInverse);
  EXPECT_EQ(data[0], 1);
  EXPECT_TRUE(std::all_of(data.begin() + 1, data.end(), [](float x) { return x == 0; }));

  std::ranges::fill(data, 1.0F);
  std::ranges::fill(expected, 0.0F);
  expected[0] = 2;
  fill_tbl();  // of no effect on the table, before or after
  r_fft(data.data(), kForward);
  EXPECT_EQ(data, expected);
}

// ---- Algebra ----

using Elements = std::array<Wide, 4>;  // row by row

Wide widened_value(Bin x) { return {x.re, x.im}; }

Elements elements_of(const Matrix &m) {
  return {widened_value(m.m11), widened_value(m.m12), widened_value(m.m21), widened_value(m.m22)};
}

TEST(ComplexMatrix, InverseAndCoefficientsMatchDoublePrecision) {
  std::mt19937_64 generator = seeded_generator();
  for (const double scale : {1e-4, 1.0, 1e4}) {
    std::normal_distribution<float> normal(0, static_cast<float>(scale));
    const auto bin = [&](double own) -> Bin {
      return {static_cast<float>(own) + normal(generator), normal(generator)};
    };
    for (int round = 0; round < 1000; ++round) {
      // Diagonally dominant: well conditioned.
      const Matrix m = {bin(12 * scale), bin(0), bin(0), bin(12 * scale)};
      const Elements a = elements_of(m);
      const Elements inverted = elements_of(inv_matrix(m));
      const Elements w = elements_of(compute_PMWF_coeff(m, 3.0F));
      const Wide det = a[0] * a[3] - a[1] * a[2];
      const Wide adjugate[] = {a[3], -a[1], -a[2], a[0]};
      const Wide d = 3.0 + a[0] + a[3] - 2.0;
      for (int i = 0; i < 4; ++i) {
        EXPECT_LT(std::abs(inverted[i] - adjugate[i] / det), 2e-6 / scale) << i;
        const Wide n = a[i] - (i % 3 == 0 ? 1.0 : 0.0);
        EXPECT_LT(std::abs(w[i] - n * std::conj(d) / (std::norm(d) + 1)), 2e-6) << i;
      }
    }
  }
}

TEST(ComplexMatrix, KnowsIdentityAndSingular) {
  const Matrix identity = {{1, 0}, {0, 0}, {0, 0}, {1, 0}};
  EXPECT_EQ(elements_of(inv_matrix(identity)), elements_of(identity));
  EXPECT_EQ(elements_of(compute_PMWF_coeff(identity, 3.0F)), Elements{});
  const Matrix all_equal = {{1, 0}, {1, 0}, {1, 0}, {1, 0}};
  for (const Wide &element : elements_of(inv_matrix(all_equal)))
    EXPECT_FALSE(std::isfinite(element.real()));
}

}  // namespace
}  // namespace orvalis::test
