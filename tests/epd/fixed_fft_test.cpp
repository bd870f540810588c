// The fixed-point transforms: step by step over the exported operators (result and flags), and
// against transforms in double precision.
#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <complex>
#include <numbers>
#include <vector>

#include "basic_op.h"
#include "fixed_fft.h"
#include "tests/support/flag_words.h"
#include "tests/support/random.h"

namespace orvalis::test {
namespace {

using Buffer = std::vector<int16_t>;

/// One way to call the transforms, with its tables.
struct Family {
  const char *name;
  Copy copy;
  int32_t band;
  int size;
  const int16_t *phs, *ii;

  Buffer transform(bool real, Buffer x, int16_t isign) const {
    if (copy == NS) {
      (real ? r_fft_ns : c_fft_ns)(x.data(), isign);
    } else {
      (real ? r_fft_epd : c_fft_epd)(x.data(), isign, band);
    }
    return x;
  }
};

const Family families[] = {{"wide", PLAIN, 0, 256, phs_tbl_WB, ii_table_WB},
                           {"narrow", PLAIN, 1, 128, phs_tbl_NB, ii_table_NB},
                           {"narrow by -1", PLAIN, -1, 128, phs_tbl_NB, ii_table_NB},
                           {"ns", NS, 0, 256, phs_tbl_256, ii_table_256}};

// ---- One operator after another ----

int16_t halved(int32_t a, int32_t b) { return round_BOP(L_shr(L_add(a, b), 1)); }

void complex_steps(const Family &family, Buffer &x, bool forward) {
  const int size = family.size;
  for (int i = 0, j = 0; i <= size - 4; i += 2) {
    if (j > i) std::swap_ranges(&x[i], &x[i] + 2, &x[j]);
    int k = size / 2;
    for (; j >= k; k /= 2) j -= k;
    j += k;
  }
  for (int stage = 0; 2 << stage < size; ++stage) {
    const int jj = 2 << stage;
    for (int first = 0; first < jj; first += 2) {
      const int16_t c = family.phs[first * family.ii[stage]];
      const int16_t s = family.phs[first * family.ii[stage] + 1];
      for (int k = first; k < size; k += 2 * jj) {
        int16_t *const near = &x[k], *const far = &x[k + jj];
        const int32_t re_c = L_mult(far[0], c), im_s = L_mult(far[1], s);
        const int16_t tr = round_BOP(forward ? L_sub(re_c, im_s) : L_add(re_c, im_s));
        const int32_t im_c = L_mult(far[1], c), re_s = L_mult(far[0], s);
        const int16_t ti = round_BOP(forward ? L_add(im_c, re_s) : L_sub(im_c, re_s));
        const auto scaled = [&](int16_t sum) {
          return static_cast<int16_t>(forward ? sum >> 1 : sum);
        };
        far[0] = scaled(sub(near[0], tr));
        far[1] = scaled(sub(near[1], ti));
        near[0] = scaled(add(near[0], tr));
        near[1] = scaled(add(near[1], ti));
      }
    }
  }
}

void split_steps(const Family &family, Buffer &x, bool forward) {
  const int16_t t0 = x[0], t1 = x[1];
  x[0] = static_cast<int16_t>(add(t0, t1) >> (forward ? 0 : 1));
  x[1] = static_cast<int16_t>(sub(t0, t1) >> (forward ? 0 : 1));
  const int16_t *P = family.phs;
  for (int i = 2; i <= family.size / 2; i += 2) {
    const int j = family.size - i;
    const int32_t re = L_deposit_h(add(x[i], x[j]));
    const int32_t im = L_deposit_h(sub(x[i + 1], x[j + 1])), im_negated = L_negate(im);
    const int16_t sum = add(x[i + 1], x[j + 1]), difference = sub(x[j], x[i]);
    const int16_t f2r = forward ? sum : negate(sum);
    const int16_t f2i = forward ? difference : negate(difference);
    const auto times = [&](int16_t factor, int at) { return L_mult(factor, P[at]); };
    if (forward) {
      x[i] = halved(re, L_sub(times(f2r, i), times(f2i, i + 1)));
      x[i + 1] = halved(im, L_add(times(f2i, i), times(f2r, i + 1)));
      x[j] = halved(re, L_add(times(f2r, j), times(f2i, j + 1)));
      x[j + 1] = halved(im_negated, L_add(L_negate(times(f2i, j)), times(f2r, j + 1)));
    } else {
      x[i] = halved(re, L_add(times(f2r, i), times(f2i, i + 1)));
      x[i + 1] = halved(im, L_sub(times(f2i, i), times(f2r, i + 1)));
      x[j] = halved(re, L_sub(times(f2r, j), times(f2i, j + 1)));
      x[j + 1] = halved(im_negated, L_negate(L_add(times(f2i, j), times(f2r, j + 1))));
    }
  }
}

Buffer random_buffer(std::mt19937_64 &random, int size, int amplitude) {
  std::uniform_int_distribution<int> sample(-amplitude, amplitude);
  Buffer x(size);
  for (int16_t &value : x) value = static_cast<int16_t>(sample(random));
  return x;
}

/// Silence, full scale of one sign, of both, and noise of every loudness.
std::vector<Buffer> signals(std::mt19937_64 &random, int size) {
  std::vector<Buffer> all{Buffer(size, 0), Buffer(size, INT16_MAX), Buffer(size, INT16_MIN)};
  for (int period = 1; period < size; period *= 2) {
    Buffer &square = all.emplace_back(size);
    for (int i = 0; i < size; ++i) square[i] = i / period % 2 ? INT16_MIN : INT16_MAX;
    all.push_back(random_buffer(random, size, 1 << (period % 15)));
    Buffer &pulse = all.emplace_back(size, int16_t{0});
    pulse[period] = INT16_MIN;
  }
  for (int i = 0; i < 60; ++i) {
    all.push_back(random_buffer(random, size, 32767 >> i % 15));
    Buffer &clipped = all.emplace_back(random_buffer(random, size, 32767));
    for (int16_t &x : clipped) x = x < 0 ? INT16_MIN : INT16_MAX;
  }
  return all;
}

TEST(FixedFft, EveryStepAndFlagInOrder) {
  std::mt19937_64 random = seeded_generator();
  int flags_raised = 0;
  for (const Family &family : families)
    for (const Buffer &input : signals(random, family.size))
      for (const int16_t isign : {1, 0, -1, 2})
        for (const bool real : {false, true})
          for (const int standing : {0, 1}) {
            const bool forward = isign == 1;
            write_flags(flags_of(PLAIN, standing, standing));
            Buffer expected = input;
            if (real && !forward) split_steps(family, expected, false);
            complex_steps(family, expected, forward);
            if (real && forward) split_steps(family, expected, true);
            const int overflow = Overflow, carry = Carry;
            flags_raised += overflow;

            write_flags(flags_of(family.copy, standing, standing));
            SCOPED_TRACE(testing::Message() << family.name << ' ' << isign << ' ' << real);
            ASSERT_EQ(family.transform(real, input, isign), expected);
            ASSERT_EQ(read_flags(), flags_of(family.copy, overflow, carry));
          }
  EXPECT_GT(flags_raised, 0) << "no signal left the flag raised";
}

// ---- Against double precision ----

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
