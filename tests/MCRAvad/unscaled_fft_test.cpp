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

/// One size with its functions and tables.
struct Size {
  int points;
  int32_t (*transform)(int32_t, int64_t *, int64_t *);
  int32_t (*frame)(const int16_t *, int32_t, int32_t *, int32_t *);
  const int32_t *sines;
  const int16_t *reversal;
  const char *complaint;
};

const Size sizes[] = {
    {512, FFT_dit2_noscale_512, Noscale_FFT_512p_Frame, sin_table_fft_512_noscale, fix_bitrev_512,
     "Voice_Engine/MCRAvad/noscale_fft_512p:331 :: input parameter error!\n"},
    {256, FFT_dit2_noscale_256_64bit, Noscale_FFT_256p_Frame_64bit, sin_table_fft_256_noscale,
     fix_bitrev_256, "Voice_Engine/MCRAvad/noscale_fft_512p:379 :: input parameter error!\n"}};

/// The sum over the even and the odd half of x, with the twiddle factors of `turn(index, points)`.
template <class Turn>
Spectrum transformed(const Spectrum &x, Turn turn) {
  if (x.size() == 1) return x;
  Spectrum even, odd, result(x.size());
  for (std::size_t i = 0; i < x.size(); i += 2) {
    even.push_back(x[i]);
    odd.push_back(x[i + 1]);
  }
  even = transformed(even, turn);
  odd = transformed(odd, turn);
  for (std::size_t k = 0; k < even.size(); ++k) {
    const std::complex<double> product = odd[k] * turn(k, x.size());
    result[k] = even[k] + product;
    result[k + even.size()] = even[k] - product;
  }
  return result;
}

std::complex<double> exact_turn(std::size_t k, std::size_t points) {
  return std::polar(1.0,
                    -2 * std::numbers::pi * static_cast<double>(k) / static_cast<double>(points));
}

/// The turn as the table has it.
auto table_turn(const Size &size) {
  return [&size](std::size_t k, std::size_t points) {
    const std::size_t i = k * static_cast<std::size_t>(size.points) / points;
    return std::complex<double>(size.sines[i + static_cast<std::size_t>(size.points) / 4] / 0x1p31,
                                -size.sines[i] / 0x1p31);
  };
}

double largest_difference(const Spectrum &a, const Spectrum &b) {
  double worst = 0;
  for (std::size_t k = 0; k < a.size(); ++k)
    worst =
        std::max({worst, std::abs(a[k].real() - b[k].real()), std::abs(a[k].imag() - b[k].imag())});
  return worst;
}

Spectrum spectrum_of_frame(const Size &size, const std::vector<int16_t> &samples) {
  std::vector<int32_t> re(size.points), im(size.points);
  EXPECT_EQ(size.frame(samples.data(), static_cast<int32_t>(samples.size()), re.data(), im.data()),
            0);
  Spectrum result;
  for (int k = 0; k < size.points; ++k) result.emplace_back(re[k], im[k]);
  return result;
}

/// Signals at full scale: noise, random signs, tones on a bin and between bins, square waves.
std::vector<std::vector<int16_t>> loud_signals(int points) {
  std::mt19937_64 random = seeded_generator();
  std::vector<std::vector<int16_t>> signals(12, std::vector<int16_t>(points));
  for (int n = 0; n < points; ++n) {
    const auto turn = [&](double cycles) {
      return std::cos(2 * std::numbers::pi * cycles * n / points);
    };
    signals[0][n] = static_cast<int16_t>(random());
    signals[1][n] = random() % 2 ? INT16_MAX : INT16_MIN;
    signals[2][n] = INT16_MIN;
    for (int s = 3; s < 9; ++s)
      signals[s][n] = static_cast<int16_t>(std::lround(32767 * turn(19.1 * (s - 2))));
    for (int s = 9; s < 12; ++s) signals[s][n] = turn(17 * s + 0.01) < 0 ? INT16_MIN : INT16_MAX;
  }
  return signals;
}

TEST(UnscaledFft, ForwardIsTheFourierTransform) {
  for (const Size &size : sizes)
    for (const std::vector<int16_t> &signal : loud_signals(size.points)) {
      const Spectrum samples(signal.begin(), signal.end());
      const Spectrum got = spectrum_of_frame(size, signal);
      double sum = 0;
      for (const int sample : signal) sum += std::abs(sample);
      // Half a unit of rounding on the factors of the table, which are exact to 5e-7 each.
      EXPECT_LE(largest_difference(got, transformed(samples, table_turn(size))), 0.51);
      EXPECT_LE(largest_difference(got, transformed(samples, exact_turn)), 0.5 + 5.5e-7 * sum);
      // At a sixteenth of full scale the factors no longer show.
      std::vector<int16_t> quiet = signal;
      for (int16_t &sample : quiet) sample = static_cast<int16_t>(sample / 16);
      const Spectrum quiet_samples(quiet.begin(), quiet.end());
      EXPECT_LE(largest_difference(spectrum_of_frame(size, quiet),
                                   transformed(quiet_samples, exact_turn)),
                1.1);
    }
}

TEST(UnscaledFft, InverseReturnsTheInput) {
  std::mt19937_64 random = seeded_generator();
  for (const Size &size : sizes)
    for (const int shift : {12, 32, 40}) {  // of 64 random bits: up to the largest without wrap
      std::vector<int64_t> re(size.points), im(size.points);
      for (int i = 0; i < size.points; ++i) {
        re[i] = static_cast<int64_t>(random()) >> shift;
        im[i] = static_cast<int64_t>(random()) >> shift;
      }
      const std::vector<int64_t> re_in = re, im_in = im;
      EXPECT_EQ(size.transform(size.points, re.data(), im.data()), 0);
      EXPECT_EQ(size.transform(-size.points, re.data(), im.data()), 0);
      // The factors are not exactly on the unit circle, by up to 7e-7 each.
      const double tolerance = 2 + std::ldexp(1.0, 63 - shift) * 4e-6;
      for (int i = 0; i < size.points; ++i) {
        EXPECT_NEAR(static_cast<double>(re[i]), static_cast<double>(re_in[i]), tolerance);
        EXPECT_NEAR(static_cast<double>(im[i]), static_cast<double>(im_in[i]), tolerance);
      }
    }
}

TEST(UnscaledFft, FramesOf32Bits) {
  std::mt19937_64 random = seeded_generator();
  std::vector<int32_t> re(256), im(256);
  Spectrum samples;
  for (int i = 0; i < 256; ++i) {
    re[i] = static_cast<int16_t>(random());
    im[i] = static_cast<int16_t>(random());
    samples.emplace_back(re[i], im[i]);
  }
  const std::vector<int32_t> re_in = re, im_in = im;
  EXPECT_EQ(Noscale_FFT_256p_Frame_64bit_be(256, re.data(), im.data()), 0);
  Spectrum got;
  for (int k = 0; k < 256; ++k) got.emplace_back(re[k], im[k]);
  EXPECT_LE(largest_difference(got, transformed(samples, table_turn(sizes[1]))), 0.51);
  EXPECT_EQ(Noscale_FFT_256p_Frame_64bit_be(-256, re.data(), im.data()), 0);
  for (int i = 0; i < 256; ++i) {
    EXPECT_NEAR(re[i], re_in[i], 1);
    EXPECT_NEAR(im[i], im_in[i], 1);
  }
}

TEST(UnscaledFft, PulseIsFlatAndSamplesBehindTheLengthAreZero) {
  for (const Size &size : sizes) {
    const Spectrum flat(size.points, -12345.0);
    EXPECT_EQ(spectrum_of_frame(size, {-12345}), flat);
    std::vector<int16_t> padded(size.points, 0);
    for (int n = 0; n < 160; ++n) padded[n] = static_cast<int16_t>(n * n - 777);
    const std::vector<int16_t> cut(padded.begin(), padded.begin() + 160);
    EXPECT_EQ(spectrum_of_frame(size, cut), spectrum_of_frame(size, padded));
  }
}

TEST(UnscaledFft, HalvesRoundUp) {
  // A pulse of -1/2 and of +1/2 of the divisor: every output is that half.
  for (const Size &size : sizes)
    for (const int sign : {-1, 1}) {
      std::vector<int64_t> re(size.points), im(size.points);
      re[0] = sign * size.points / 2;
      size.transform(-size.points, re.data(), im.data());
      EXPECT_EQ(re, std::vector<int64_t>(size.points, sign < 0 ? 0 : 1));
    }
  // Inverse of a pulse of 128, then to integers: 0.5 again.
  for (const int sign : {-1, 1}) {
    std::vector<int32_t> re(256), im(256);
    re[0] = sign * 128;
    im[0] = -sign * 128;
    Noscale_FFT_256p_Frame_64bit_be(-256, re.data(), im.data());
    EXPECT_EQ(re, std::vector<int32_t>(256, sign < 0 ? 0 : 1));
    EXPECT_EQ(im, std::vector<int32_t>(256, sign < 0 ? 1 : 0));
  }
}

TEST(UnscaledFft, ResultsWrapWithoutSaturation) {
  // Bin 0 is the sum, a little below or above 2^31; its factors are 1 - 2^-31.
  for (const int beside : {-100, 100}) {
    std::vector<int32_t> re(256, (1 << 23) + beside), im(256, 0);
    Noscale_FFT_256p_Frame_64bit_be(256, re.data(), im.data());
    const double sum = 0x1p31 + 256.0 * beside;
    EXPECT_NEAR(re[0], beside < 0 ? sum : sum - 0x1p32, 10);
  }
}

TEST(UnscaledFft, WrongParameters) {
  std::vector<int16_t> in(513);
  std::vector<int32_t> re(512), im(512);
  std::vector<int64_t> wide(512);
  for (const Size &size : sizes) {
    const auto refused = [&](const int16_t *samples, int32_t length, int32_t *r, int32_t *i) {
      testing::internal::CaptureStdout();
      EXPECT_EQ(size.frame(samples, length, r, i), -1);
      EXPECT_EQ(testing::internal::GetCapturedStdout(), size.complaint);
    };
    refused(nullptr, 160, re.data(), im.data());
    refused(in.data(), 160, nullptr, im.data());
    refused(in.data(), 160, re.data(), nullptr);
    for (const int32_t length : {size.points + 1, 0, -1, INT32_MIN})
      refused(in.data(), length, re.data(), im.data());
    EXPECT_EQ(size.frame(in.data(), size.points, re.data(), im.data()), 0);
    EXPECT_EQ(size.transform(size.points, nullptr, wide.data()), -1);
    EXPECT_EQ(size.transform(size.points, wide.data(), nullptr), -1);
  }
}

TEST(UnscaledFft, TablesAndReordering) {
  for (const Size &size : sizes)
    for (int i = 0; i < size.points; ++i) {
      const double sine =
          i % (size.points / 2) == 0 ? 0 : std::sin(2 * std::numbers::pi * i / size.points);
      const auto single = static_cast<float>(std::rint(sine * 1e6) / 1e6);
      EXPECT_EQ(size.sines[i], std::min<int64_t>(static_cast<int64_t>(single * 0x1p31f), INT32_MAX))
          << i;
      int reversed = 0;
      for (int bit = 1; bit < size.points; bit *= 2) reversed = 2 * reversed + (i & bit ? 1 : 0);
      EXPECT_EQ(size.reversal[i], reversed) << i;
    }
  EXPECT_EQ(sin_table_fft_256_noscale[1], 52701396);

  const int16_t table[] = {2, 1, 0, 5};  // 3 asks for 5, which is beyond the four values here
  int64_t re64[] = {10, 11, 12, 13, 14, 15}, im64[] = {20, 21, 22, 23, 24, 25};
  int32_t re32[] = {10, 11, 12, 13, 14, 15}, im32[] = {20, 21, 22, 23, 24, 25};
  int_bitrev(4, re64, im64, table);
  int_bitrev_32bit(3, re32, im32, table);
  EXPECT_EQ(std::vector<int64_t>(re64, re64 + 6), (std::vector<int64_t>{12, 11, 10, 15, 14, 13}));
  EXPECT_EQ(std::vector<int64_t>(im64, im64 + 6), (std::vector<int64_t>{22, 21, 20, 25, 24, 23}));
  EXPECT_EQ(std::vector<int32_t>(re32, re32 + 6), (std::vector<int32_t>{12, 11, 10, 13, 14, 15}));
  EXPECT_EQ(std::vector<int32_t>(im32, im32 + 6), (std::vector<int32_t>{22, 21, 20, 23, 24, 25}));
}

}  // namespace
}  // namespace orvalis::test
