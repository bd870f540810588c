// The unscaled transforms against transforms in double precision.
#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <complex>
#include <numbers>
#include <vector>

#include "noscale_fft_512p.h"
#include "tests/support/random.h"

namespace orvalis::test {
namespace {

using Spectrum = std::vector<std::complex<double>>;
using Samples = std::vector<int16_t>;
constexpr double pi = std::numbers::pi;

/// One size with its functions and tables.
struct Size {
  std::size_t points;
  int32_t (*transform)(int32_t, int64_t *, int64_t *);
  int32_t (*frame)(const int16_t *, int32_t, int32_t *, int32_t *);
  const int32_t *sines;

  int32_t n() const { return static_cast<int32_t>(points); }
  std::complex<double> exact_turn(std::size_t i) const {
    return std::polar(1.0, -2 * pi * i / n());
  }
  std::complex<double> table_turn(std::size_t i) const {
    return {sines[i + points / 4] / 0x1p31, -sines[i] / 0x1p31};
  }
};

const Size sizes[] = {
    {512, FFT_dit2_noscale_512, Noscale_FFT_512p_Frame, sin_table_fft_512_noscale},
    {256, FFT_dit2_noscale_256_64bit, Noscale_FFT_256p_Frame_64bit, sin_table_fft_256_noscale}};

using Turn = std::complex<double> (Size::*)(std::size_t) const;

/// The Fourier transform from those of the even and the odd values, with either kind of factors.
Spectrum fourier(const Spectrum &x, const Size &size, Turn turn) {
  if (x.size() == 1) return x;
  Spectrum even, odd, result(x.size());
  for (std::size_t i = 0; i < x.size(); ++i) (i % 2 ? odd : even).push_back(x[i]);
  even = fourier(even, size, turn);
  odd = fourier(odd, size, turn);
  for (std::size_t k = 0; k < even.size(); ++k) {
    odd[k] *= (size.*turn)(k * size.points / x.size());
    result[k] = even[k] + odd[k];
    result[k + even.size()] = even[k] - odd[k];
  }
  return result;
}

double largest_difference(const Spectrum &a, const Spectrum &b) {
  double worst = 0;
  for (std::size_t k = 0; k < a.size(); ++k)
    worst = std::max({worst, std::abs((a[k] - b[k]).real()), std::abs((a[k] - b[k]).imag())});
  return worst;
}

Spectrum spectrum_of(const Size &size, const Samples &samples) {
  std::vector<int32_t> re(size.points), im(size.points);
  EXPECT_EQ(size.frame(samples.data(), static_cast<int32_t>(samples.size()), re.data(), im.data()),
            0);
  Spectrum result;
  for (std::size_t k = 0; k < size.points; ++k) result.emplace_back(re[k], im[k]);
  return result;
}

TEST(UnscaledFft, ForwardIsTheFourierTransform) {
  std::mt19937_64 random = seeded_generator();
  for (const Size &size : sizes)
    for (const int divisor : {1, 16})
      for (int kind = 0; kind < 9; ++kind) {  // noise, signs, constant, three tones, three squares
        Samples samples;
        double sum = 0;
        for (int n = 0; n < size.n(); ++n) {
          const double tone = std::cos(2 * pi * 19.1 * (kind - 2) * n / size.n());
          const double signal = kind == 0   ? static_cast<int16_t>(random())
                                : kind == 1 ? (random() % 2 ? INT16_MAX : INT16_MIN)
                                : kind < 6  ? 32767 * tone
                                            : (tone < 0 ? INT16_MIN : INT16_MAX);
          samples.push_back(static_cast<int16_t>(signal / divisor));
          sum += std::abs(samples.back());
        }
        const Spectrum x(samples.begin(), samples.end()), got = spectrum_of(size, samples);
        // Half a unit of rounding; the factors of the table are exact to 5e-7 each.
        EXPECT_LE(largest_difference(got, fourier(x, size, &Size::table_turn)), 0.51) << kind;
        EXPECT_LE(largest_difference(got, fourier(x, size, &Size::exact_turn)), 0.5 + 5.5e-7 * sum);
      }
}

TEST(UnscaledFft, InverseReturnsTheInput) {
  std::mt19937_64 random = seeded_generator();
  for (const Size &size : sizes)
    for (const int shift : {12, 32, 40}) {  // of 64 random bits: up to the largest without wrap
      std::vector<int64_t> re(size.points), im(size.points);
      for (int64_t &x : re) x = static_cast<int64_t>(random()) >> shift;
      for (int64_t &x : im) x = static_cast<int64_t>(random()) >> shift;
      const std::vector<int64_t> re_in = re, im_in = im;
      EXPECT_EQ(size.transform(size.n(), re.data(), im.data()), 0);
      EXPECT_EQ(size.transform(-size.n(), re.data(), im.data()), 0);
      // The factors are not exactly on the unit circle. A 16-bit input comes back whole.
      const double tolerance = 2 + std::ldexp(4e-6, 63 - shift);
      for (std::size_t i = 0; i < size.points; ++i) {
        EXPECT_NEAR(static_cast<double>(re[i] - re_in[i]), 0, tolerance);
        EXPECT_NEAR(static_cast<double>(im[i] - im_in[i]), 0, tolerance);
      }
    }
}

TEST(UnscaledFft, PulseIsFlatHalvesRoundUpSumsWrap) {
  for (const Size &size : sizes) {
    EXPECT_EQ(spectrum_of(size, {-12345}), Spectrum(size.points, -12345.0));
    for (const int sign : {-1, 1}) {
      std::vector<int64_t> re(size.points), im(size.points);
      re[0] = sign * size.n() / 2;
      size.transform(-size.n(), re.data(), im.data());
      EXPECT_EQ(re, std::vector<int64_t>(size.points, sign < 0 ? 0 : 1));
    }
  }
  for (const int sign : {-1, 1}) {
    // An inverse pulse of 128 is 0.5 everywhere.
    std::vector<int32_t> re(256), im(256);
    re[0] = sign * 128;
    im[0] = -sign * 128;
    EXPECT_EQ(Noscale_FFT_256p_Frame_64bit_be(-256, re.data(), im.data()), 0);
    EXPECT_EQ(re, std::vector<int32_t>(256, sign < 0 ? 0 : 1));
    EXPECT_EQ(im, std::vector<int32_t>(256, sign < 0 ? 1 : 0));
    // A constant has its sum in bin 0, here a little above or below 2^31; the factors are
    // 1 - 2^-31.
    std::fill(re.begin(), re.end(), (1 << 23) + 100 * sign);
    EXPECT_EQ(Noscale_FFT_256p_Frame_64bit_be(256, re.data(), im.data()), 0);
    EXPECT_NEAR(re[0], 0x1p31 + 25600 * sign - (sign > 0 ? 0x1p32 : 0), 10);
  }
}

}  // namespace
}  // namespace orvalis::test
