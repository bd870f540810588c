// The single-precision transform and the algebra on its bins, against double precision.
#include "Voice_Engine/ns/float_fft.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <cmath>
#include <complex>
#include <memory>
#include <numbers>
#include <random>
#include <vector>

#include "Voice_Engine/ns/pmwf.h"
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

TEST(FloatFft, HasTheTwiddleFactorsOfTheCLibrary) {
  for (int k = 0; k < 256; ++k) {
    // Not a constant, or the compiler would round for the C library.
    const volatile double angle = k * -0.01227184630308513;
    EXPECT_EQ(twiddles[k].re, std::cos(angle)) << k;
    EXPECT_EQ(twiddles[k].im, std::sin(angle)) << k;
  }
  EXPECT_TRUE(std::signbit(twiddles[0].im));
}

// ---- Algebra ----

template <class Value>
void randomise(Bins<Value> &bins, std::mt19937_64 &generator, double scale = 1) {
  std::normal_distribution<float> normal(0, static_cast<float>(scale));
  for (float &x : bins.re) x = normal(generator);
  for (float &x : bins.im) x = normal(generator);
}

/// Element i of a bin, in double precision.
template <class Value>
Wide at(const Bins<Value> &bins, int bin, int i) {
  const int place = Bins<Value>::kParts * bin + i;
  return {bins.re[place], bins.im[place]};
}

#define EXPECT_CLOSE(got, expected, scale) \
  EXPECT_LT(std::abs((got) - (expected)), 1e-6 * (scale)) << "bin " << k << ", element " << i

TEST(Pmwf, ProductsMatchDoublePrecision) {
  std::mt19937_64 generator = seeded_generator();
  Matrices a, b, matrix;
  Pairs row, column, product;
  Scalars scalar;
  for (int round = 0; round < 20; ++round) {
    randomise(a, generator);
    randomise(b, generator);
    randomise(row, generator);
    randomise(column, generator);
    mul_2by2_matrix(a, b, matrix);
    mul_1by2_2by2_matrix(row, b, product);
    mul_1by2_2by1_matrix(row, column, scalar);
    for (int k = 0; k < 256; ++k) {
      for (int i = 0; i < 4; ++i)
        EXPECT_CLOSE(at(matrix, k, i),
                     at(a, k, i & 2) * at(b, k, i & 1) + at(a, k, i | 1) * at(b, k, i | 2), 30);
      for (int i = 0; i < 2; ++i)
        EXPECT_CLOSE(at(product, k, i),
                     at(row, k, 0) * at(b, k, i) + at(row, k, 1) * at(b, k, i + 2), 30);
      const int i = 0;
      EXPECT_CLOSE(at(scalar, k, 0),
                   at(row, k, 0) * at(column, k, 0) + at(row, k, 1) * at(column, k, 1), 30);
    }
    mul_2by1_1by2_matrix(column, row, matrix);
    for (int k = 0; k < 256; ++k)
      for (int i = 0; i < 4; ++i)
        EXPECT_CLOSE(at(matrix, k, i), at(column, k, i / 2) * at(row, k, i % 2), 20);
  }
}

TEST(Pmwf, InverseAndCoefficientsMatchDoublePrecision) {
  std::mt19937_64 generator = seeded_generator();
  Matrices a, inverted, w;
  for (const double scale : {1e-4, 1.0, 1e4}) {
    randomise(a, generator, scale);
    for (int k = 0; k < 256; ++k) {  // diagonally dominant: well conditioned
      a.re[4 * k] += static_cast<float>(12 * scale);
      a.re[4 * k + 3] += static_cast<float>(12 * scale);
    }
    inv_matrix(a, inverted);
    compute_PMWF_coeff(a, w, 3.0F);
    for (int k = 0; k < 256; ++k) {
      const Wide det = at(a, k, 0) * at(a, k, 3) - at(a, k, 1) * at(a, k, 2);
      const Wide adjugate[] = {at(a, k, 3), -at(a, k, 1), -at(a, k, 2), at(a, k, 0)};
      const Wide d = 3.0 + at(a, k, 0) + at(a, k, 3) - 2.0;
      for (int i = 0; i < 4; ++i) {
        EXPECT_CLOSE(at(inverted, k, i), adjugate[i] / det, 2 / scale);
        const Wide n = at(a, k, i) - (i % 3 == 0 ? 1.0 : 0.0);
        EXPECT_CLOSE(at(w, k, i), n * std::conj(d) / (std::norm(d) + 1), 2);
      }
    }
  }
}

TEST(Pmwf, KnowsIdentitySingularAndHermitian) {
  std::mt19937_64 generator = seeded_generator();
  Matrices a{}, out;
  for (int k = 0; k < 256; ++k) a.re[4 * k] = a.re[4 * k + 3] = 1;
  a.re[4 * 7 + 1] = a.re[4 * 7 + 2] = 1;  // all elements of bin 7 are equal
  inv_matrix(a, out);
  for (int i = 0; i < 1024; ++i) {
    if (i / 4 == 7) {
      EXPECT_FALSE(std::isfinite(out.re[i]));
    } else {
      EXPECT_EQ(out.re[i], a.re[i]);
      EXPECT_EQ(out.im[i], 0);
    }
  }
  a.re[4 * 7 + 1] = a.re[4 * 7 + 2] = 0;
  compute_PMWF_coeff(a, out, 3.0F);
  for (int i = 0; i < 1024; ++i) {
    EXPECT_EQ(out.re[i], 0);
    EXPECT_EQ(out.im[i], 0);
  }

  Pairs column, row;
  randomise(column, generator, 1000);
  row = column;
  for (float &x : row.im) x = -x;
  mul_2by1_1by2_matrix(column, row, out);
  for (int k = 0; k < 256; ++k) {
    const double size = std::norm(at(column, k, 0)) + std::norm(at(column, k, 1));
    const int i = 0;
    for (const int diagonal : {0, 3}) {
      EXPECT_GE(at(out, k, diagonal).real(), 0);
      EXPECT_LT(std::abs(at(out, k, diagonal).imag()), 1e-7 * size);
    }
    EXPECT_CLOSE(at(out, k, 1), std::conj(at(out, k, 2)), size);
  }
}

TEST(Pmwf, EachBinStandsAlone) {
  // The same matrix gives the same bits wherever in the array it stands.
  std::mt19937_64 generator = seeded_generator();
  Matrices a, b, product, product_turned, inverted, inverted_turned, w, w_turned;
  const auto turned = [](const Matrices &bins, int by) {
    Matrices result = bins;
    std::rotate(std::begin(result.re), std::begin(result.re) + 4 * by, std::end(result.re));
    std::rotate(std::begin(result.im), std::begin(result.im) + 4 * by, std::end(result.im));
    return result;
  };
  const auto same = [](const Matrices &x, const Matrices &y) {
    return std::ranges::equal(x.re, y.re) && std::ranges::equal(x.im, y.im);
  };
  randomise(a, generator);
  randomise(b, generator);
  mul_2by2_matrix(a, b, product);
  inv_matrix(a, inverted);
  compute_PMWF_coeff(a, w, 3.0F);
  for (int by = 1; by < 9; ++by) {
    mul_2by2_matrix(turned(a, by), turned(b, by), product_turned);
    inv_matrix(turned(a, by), inverted_turned);
    compute_PMWF_coeff(turned(a, by), w_turned, 3.0F);
    EXPECT_TRUE(same(product_turned, turned(product, by)));
    EXPECT_TRUE(same(inverted_turned, turned(inverted, by)));
    EXPECT_TRUE(same(w_turned, turned(w, by)));
  }
}

}  // namespace
}  // namespace orvalis::test
