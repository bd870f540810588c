// The fixed-point transforms against transforms in double precision.
#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <complex>
#include <numbers>
#include <vector>

#include "fixed_fft.h"
#include "tests/support/random.h"

namespace orvalis::test {
namespace {

using Buffer = std::vector<int16_t>;

/// One way to call the transforms.
struct Family {
  const char *name;
  bool is_ns;
  int32_t band;
  int size;

  Buffer transform(bool real, Buffer x, int16_t isign) const {
    if (is_ns) {
      (real ? r_fft_ns : c_fft_ns)(x.data(), isign);
    } else {
      (real ? r_fft_epd : c_fft_epd)(x.data(), isign, band);
    }
    return x;
  }
};

const Family families[] = {{"wide", false, 0, 256},
                           {"narrow", false, 1, 128},
                           {"narrow by -1", false, -1, 128},
                           {"ns", true, 0, 256}};

Buffer random_buffer(std::mt19937_64 &random, int size, int amplitude) {
  std::uniform_int_distribution<int> sample(-amplitude, amplitude);
  Buffer x(size);
  for (int16_t &value : x) value = static_cast<int16_t>(sample(random));
  return x;
}

using Spectrum = std::vector<std::complex<double>>;

/// Elements 2k and 2k + 1 as complex values.
Spectrum pairs(const Buffer &x) {
  Spectrum z;
  for (std::size_t i = 0; i < x.size(); i += 2) z.emplace_back(x[i], x[i + 1]);
  return z;
}

/// The plain sum over e^(sign 2 pi j n k / points), divided by `scale`, for the first `bins` bins.
Spectrum dft(const Spectrum &z, int sign, double scale, std::size_t bins) {
  Spectrum result(bins);
  for (std::size_t k = 0; k < bins; ++k) {
    for (std::size_t n = 0; n < z.size(); ++n)
      result[k] += z[n] * std::polar(1 / scale, sign * 2 * std::numbers::pi *
                                                    static_cast<double>(n * k % z.size()) /
                                                    static_cast<double>(z.size()));
  }
  return result;
}

double largest_difference(const Buffer &got, const Spectrum &expected) {
  double worst = 0;
  const Spectrum z = pairs(got);
  for (std::size_t k = 0; k < z.size(); ++k)
    worst = std::max({worst, std::abs(z[k].real() - expected[k].real()),
                      std::abs(z[k].imag() - expected[k].imag())});
  return worst;
}

/// What the real transform should give: DC and Nyquist share the first pair.
Spectrum real_spectrum(const Buffer &x) {
  const Spectrum samples(x.begin(), x.end());
  const std::size_t half = x.size() / 2;
  Spectrum bins = dft(samples, -1, static_cast<double>(half), half + 1);
  bins[0] = {bins[0].real(), bins[half].real()};
  bins.pop_back();
  return bins;
}

// sqrt(2) times this is 16383: no sum of a forward stage can leave the range.
constexpr int LOUDEST_UNSATURATED = 11584;

TEST(FixedFft, ForwardIsTheScaledFourierTransformAndInverseUndoesIt) {
  std::mt19937_64 random = seeded_generator();
  for (const Family &family : families)
    for (int amplitude = LOUDEST_UNSATURATED; amplitude > 0; amplitude /= 4) {
      SCOPED_TRACE(testing::Message() << family.name << " amplitude " << amplitude);
      const Buffer input = random_buffer(random, family.size, amplitude);
      const Buffer complex = family.transform(false, input, 1);
      const Buffer real = family.transform(true, input, 1);
      const Spectrum samples = pairs(input);
      EXPECT_LT(largest_difference(complex, dft(samples, -1, family.size / 2.0, samples.size())),
                4);
      EXPECT_LT(largest_difference(real, real_spectrum(input)), 6);
      EXPECT_LT(largest_difference(family.transform(false, complex, 0), samples), 128);
      EXPECT_LT(largest_difference(family.transform(true, real, -1), samples), 128);
    }
}

TEST(FixedFft, FullScale) {
  for (const Family &family : families) {
    SCOPED_TRACE(family.name);
    Buffer pulse(family.size, int16_t{0});
    pulse[3] = INT16_MIN;
    EXPECT_LT(largest_difference(family.transform(true, pulse, 1), real_spectrum(pulse)), 6);
    // The first stage already saturates, at 16383 after its halving; the split doubles that.
    const Buffer constant = family.transform(true, Buffer(family.size, int16_t{20000}), 1);
    EXPECT_EQ(constant[0], 32766);
    EXPECT_EQ(constant[1], 0);
    // The inverse does not scale: a spectrum half full saturates at both ends.
    Buffer tone(family.size, int16_t{0});
    tone[0] = tone[1] = INT16_MAX;
    for (int i = 2; i < family.size / 2; i += 2) tone[i] = INT16_MAX;
    const Buffer wave = family.transform(true, tone, -1);
    EXPECT_EQ(*std::max_element(wave.begin(), wave.end()), INT16_MAX);
    EXPECT_EQ(*std::min_element(wave.begin(), wave.end()), INT16_MIN);
  }
}

}  // namespace
}  // namespace orvalis::test
