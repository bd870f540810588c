// The engine's three transforms against the Fourier transform in double precision, and back.
#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>

#include "fixed_fft.h"
#include "float_fft.h"
#include "noscale_fft_512p.h"
#include "tests/support/fourier.h"
#include "tests/support/random.h"

namespace orvalis::test {
namespace {

/// Pairs of parts as complex values.
template <class Values>
Spectrum pairs(const Values &x) {
  Spectrum z;
  for (std::size_t i = 0; i < x.size(); i += 2) z.emplace_back(x[i], x[i + 1]);
  return z;
}

template <class Value>
std::vector<Value> noise(std::mt19937_64 &random, std::size_t size, double amplitude) {
  std::vector<Value> values(size);
  for (Value &x : values)
    x = static_cast<Value>(std::uniform_real_distribution(-amplitude, amplitude)(random));
  return values;
}

double largest_difference(const Spectrum &got, const Spectrum &expected) {
  double worst = 0;
  for (std::size_t k = 0; k < got.size(); ++k) {
    const auto error = got[k] - expected[k];
    worst = std::max({worst, std::abs(error.real()), std::abs(error.imag())});
  }
  return worst;
}

/// Holds a real transform and its inverse; the complex one is inside.
template <class Value, class Transform>
void expect_pair(std::vector<Value> x, Transform transform, double tolerance,
                 double inverse_tolerance) {
  const Spectrum expected = packed_bins({x.begin(), x.end()}), samples = pairs(x);
  transform(x.data(), 1);
  EXPECT_LT(largest_difference(pairs(x), expected), tolerance);
  transform(x.data(), -1);
  EXPECT_LT(largest_difference(pairs(x), samples), inverse_tolerance);
}

TEST(Transforms, FixedPointAndSinglePrecision) {
  std::mt19937_64 random = seeded_generator();
  // sqrt(2) times the first amplitude is 16383: no sum of a forward stage can leave the range.
  for (double amplitude = 11584; amplitude > 1; amplitude /= 4) {
    const auto wide = noise<int16_t>(random, 256, amplitude);
    expect_pair(wide, r_fft_ns, 6, 128);
    expect_pair(
        wide, [](int16_t *x, int16_t isign) { r_fft_epd(x, isign, 0); }, 6, 128);
    expect_pair(
        noise<int16_t>(random, 128, amplitude),
        [](int16_t *x, int16_t isign) { r_fft_epd(x, isign, 1); }, 6, 128);
  }
  for (const double scale : {1e-10, 1.0, 32768.0, 1e10})
    expect_pair(noise<float>(random, 512, scale), r_fft, 1e-6 * scale, 1e-6 * scale);
}

TEST(Transforms, Unscaled) {
  std::mt19937_64 random = seeded_generator();
  for (const bool is_long : {true, false}) {
    const std::size_t size = is_long ? 512 : 256;
    const auto frame = is_long ? Noscale_FFT_512p_Frame : Noscale_FFT_256p_Frame_64bit;
    const auto transform = is_long ? FFT_dit2_noscale_512 : FFT_dit2_noscale_256_64bit;
    const auto n = static_cast<int32_t>(size);
    for (const double amplitude : {32767.0, 2000.0, 1.0}) {
      const auto samples = noise<int16_t>(random, size, amplitude);
      std::vector<int32_t> re(size), im(size);
      EXPECT_EQ(frame(samples.data(), n, re.data(), im.data()), 0);
      Spectrum got;
      for (std::size_t k = 0; k < size; ++k) got.emplace_back(re[k], im[k]);
      // Half a unit of rounding; the factors are exact to 5e-7 each.
      EXPECT_LE(largest_difference(got, fourier({samples.begin(), samples.end()})),
                0.51 + 2.8e-7 * amplitude * static_cast<double>(size));

      const auto wide = noise<int64_t>(random, size, amplitude * 0x1p32);
      std::vector<int64_t> x = wide, y = wide;
      EXPECT_EQ(transform(n, x.data(), y.data()) | transform(-n, x.data(), y.data()), 0);
      for (const auto &back : {x, y})
        EXPECT_LE(largest_difference({back.begin(), back.end()}, {wide.begin(), wide.end()}),
                  2 + 8e-6 * amplitude * 0x1p32);
    }
  }
}

}  // namespace
}  // namespace orvalis::test
