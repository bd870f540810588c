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
using Sum16 = int16_t (*)(int16_t, int16_t);

/// One way to call the transforms, with its operators and tables.
struct Family {
  const char *name;
  Copy copy;
  int32_t band;
  int size;
  const int16_t *phs, *ii;
  Sum16 add, sub, shl, shr;
  int16_t (*negate)(int16_t);
  int16_t (*round)(int32_t);
  int32_t (*L_mult)(int16_t, int16_t);
  int32_t (*L_add)(int32_t, int32_t);
  int32_t (*L_sub)(int32_t, int32_t);
  int32_t (*L_negate)(int32_t);
  int32_t (*L_shr)(int32_t, int16_t);
  int32_t (*deposit)(int16_t);

  Buffer complex(Buffer x, int16_t isign) const {
    copy == NS ? c_fft_ns(x.data(), isign) : c_fft_epd(x.data(), isign, band);
    return x;
  }
  Buffer real(Buffer x, int16_t isign) const {
    copy == NS ? r_fft_ns(x.data(), isign) : r_fft_epd(x.data(), isign, band);
    return x;
  }
};

Family plain_family(const char *name, int32_t band, int size, const int16_t *phs,
                    const int16_t *ii) {
  return {name, PLAIN,  band,      size,   phs,   ii,    add,      sub,   shl,
          shr,  negate, round_BOP, L_mult, L_add, L_sub, L_negate, L_shr, L_deposit_h};
}

const Family families[] = {
    plain_family("wide", 0, 256, phs_tbl_WB, ii_table_WB),
    plain_family("narrow", 1, 128, phs_tbl_NB, ii_table_NB),
    plain_family("narrow by -1", -1, 128, phs_tbl_NB, ii_table_NB),
    {"ns", NS, 0, 256, phs_tbl_256, ii_table_256, ns_add, ns_sub, ns_shl, ns_shr, ns_negate,
     ns_round, L_ns_mult, L_ns_add, L_ns_sub, L_ns_negate, L_ns_shr, ns_L_deposit_h}};

// ---- One operator after another ----

void complex_steps(const Family &f, Buffer &x, bool forward) {
  const auto size = static_cast<int16_t>(f.size);
  int16_t j = 0;
  for (int16_t i = 0; i <= size - 4; i = static_cast<int16_t>(i + 2)) {
    if (j > i) std::swap_ranges(&x[i], &x[i] + 2, &x[j]);
    auto k = static_cast<int16_t>(size / 2);
    while (j >= k) {
      j = f.sub(j, k);
      k = f.shr(k, 1);
    }
    j = static_cast<int16_t>(j + k);
  }
  for (int16_t stage = 0; 2 << stage < size; ++stage) {
    const int16_t jj = f.shl(2, stage), kk = f.shl(jj, 1);
    for (int16_t first = 0; first < jj; first = static_cast<int16_t>(first + 2)) {
      const int16_t c = f.phs[first * f.ii[stage]], s = f.phs[first * f.ii[stage] + 1];
      for (int16_t k = first; k < size; k = static_cast<int16_t>(k + kk)) {
        const int16_t kj = f.add(k, jj);
        int16_t &re = x[k], &im = x[k + 1], &far_re = x[kj], &far_im = x[kj + 1];
        const int32_t re_c = f.L_mult(far_re, c), im_s = f.L_mult(far_im, s);
        const int16_t tr = f.round(forward ? f.L_sub(re_c, im_s) : f.L_add(re_c, im_s));
        const int32_t im_c = f.L_mult(far_im, c), re_s = f.L_mult(far_re, s);
        const int16_t ti = f.round(forward ? f.L_add(im_c, re_s) : f.L_sub(im_c, re_s));
        const auto scaled = [&](int16_t sum) { return forward ? f.shr(sum, 1) : sum; };
        far_re = scaled(f.sub(re, tr));
        far_im = scaled(f.sub(im, ti));
        re = scaled(f.add(re, tr));
        im = scaled(f.add(im, ti));
      }
    }
  }
}

void split_steps(const Family &f, Buffer &x, bool forward) {
  const int16_t t0 = x[0], t1 = x[1];
  x[0] = forward ? f.add(t0, t1) : f.shr(f.add(t0, t1), 1);
  x[1] = forward ? f.sub(t0, t1) : f.shr(f.sub(t0, t1), 1);
  const int16_t *P = f.phs;
  for (int i = 2; i <= f.size / 2; i += 2) {
    const int j = f.size - i;
    const int16_t f1r = f.add(x[i], x[j]);
    const int16_t f1i = f.sub(x[i + 1], x[j + 1]);
    const int16_t f2r = forward ? f.add(x[i + 1], x[j + 1]) : f.negate(f.add(x[j + 1], x[i + 1]));
    const int16_t f2i = forward ? f.sub(x[j], x[i]) : f.negate(f.sub(x[j], x[i]));
    const auto half = [&](int32_t f1, int32_t turned) {
      return f.round(f.L_shr(f.L_add(f1, turned), 1));
    };
    const int32_t re = f.deposit(f1r), im = f.deposit(f1i), im_negated = f.L_negate(im);
    const auto L_mult = f.L_mult;
    if (forward) {
      x[i] = half(re, f.L_sub(L_mult(f2r, P[i]), L_mult(f2i, P[i + 1])));
      x[i + 1] = half(im, f.L_add(L_mult(f2i, P[i]), L_mult(f2r, P[i + 1])));
      x[j] = half(re, f.L_add(L_mult(f2r, P[j]), L_mult(f2i, P[j + 1])));
      x[j + 1] = half(im_negated, f.L_add(f.L_negate(L_mult(f2i, P[j])), L_mult(f2r, P[j + 1])));
    } else {
      x[i] = half(re, f.L_add(L_mult(f2r, P[i]), L_mult(f2i, P[i + 1])));
      x[i + 1] = half(im, f.L_sub(L_mult(f2i, P[i]), L_mult(f2r, P[i + 1])));
      x[j] = half(re, f.L_sub(L_mult(f2r, P[j]), L_mult(f2i, P[j + 1])));
      x[j + 1] = half(im_negated, f.L_negate(f.L_add(L_mult(f2i, P[j]), L_mult(f2r, P[j + 1]))));
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
            write_flags(flags_of(family.copy, standing, standing));
            Buffer expected = input;
            if (real && !forward) split_steps(family, expected, false);
            complex_steps(family, expected, forward);
            if (real && forward) split_steps(family, expected, true);
            const FlagWords expected_flags = read_flags();
            flags_raised += expected_flags[2 * family.copy];

            write_flags(flags_of(family.copy, standing, standing));
            ASSERT_EQ(real ? family.real(input, isign) : family.complex(input, isign), expected)
                << family.name << " isign " << isign << (real ? " real" : " complex");
            ASSERT_EQ(read_flags(), expected_flags)
                << family.name << " isign " << isign << (real ? " real" : " complex");
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

TEST(FixedFft, ForwardIsTheScaledFourierTransform) {
  std::mt19937_64 random = seeded_generator();
  for (const Family &family : families)
    for (int amplitude = LOUDEST_UNSATURATED; amplitude > 4; amplitude /= 4) {
      SCOPED_TRACE(testing::Message() << family.name << " amplitude " << amplitude);
      const Buffer noise = random_buffer(random, family.size, amplitude);
      // A tone in one bin, all other bins dark; and one sample of full scale, all bins alike.
      Buffer tone(family.size), pulse(family.size);
      for (int i = 0; i < family.size; ++i)
        tone[i] = static_cast<int16_t>(
            std::lround(amplitude * std::cos(2 * std::numbers::pi * 5 * i / family.size)));
      pulse[amplitude % family.size] = INT16_MAX;
      for (const Buffer &input : {noise, tone, pulse}) {
        const Spectrum bins = dft(pairs(input), -1, family.size / 2.0, input.size() / 2);
        EXPECT_LT(largest_difference(family.complex(input, 1), bins), 4);
        EXPECT_LT(largest_difference(family.real(input, 1), real_spectrum(input)), 6);
      }
      EXPECT_NEAR(family.real(tone, 1)[10], amplitude, 6);
    }
}

TEST(FixedFft, InverseIsTheUnscaledSum) {
  std::mt19937_64 random = seeded_generator();
  for (const Family &family : families)
    for (const int amplitude : {4, 60, 1000}) {
      SCOPED_TRACE(testing::Message() << family.name << " amplitude " << amplitude);
      const Buffer bins = random_buffer(random, family.size, amplitude);
      const Spectrum sums = dft(pairs(bins), 1, 1, bins.size() / 2);
      EXPECT_LT(largest_difference(family.complex(bins, 0), sums), 16);
    }
}

TEST(FixedFft, RoundTrip) {
  std::mt19937_64 random = seeded_generator();
  for (const Family &family : families)
    for (const int amplitude : {0, 100, 3000, LOUDEST_UNSATURATED}) {
      SCOPED_TRACE(testing::Message() << family.name << " amplitude " << amplitude);
      const Buffer input = random_buffer(random, family.size, amplitude);
      const Spectrum expected = pairs(input);
      EXPECT_LT(largest_difference(family.complex(family.complex(input, 1), 0), expected), 128);
      EXPECT_LT(largest_difference(family.real(family.real(input, 1), -1), expected), 128);
    }
}

TEST(FixedFft, SumsSaturateInsteadOfWrapping) {
  for (const Family &family : families) {
    SCOPED_TRACE(family.name);
    // A constant has twice its value as DC; above half scale the sums stop before they are halved.
    EXPECT_EQ(family.real(Buffer(family.size, 20000), 1)[0], 2 * (INT16_MAX / 2));
    EXPECT_EQ(family.real(Buffer(family.size, INT16_MIN), 1)[0], INT16_MIN);
    const Buffer medium = family.real(Buffer(family.size, 16000), 1);
    EXPECT_NEAR(medium[0], 32000, 16);
    Buffer alternating(family.size, 16000);
    for (int i = 1; i < family.size; i += 2) alternating[i] = -16000;
    EXPECT_NEAR(family.real(alternating, 1)[1], 32000, 16);
    // All bins alike are one pulse of many times the range.
    const Buffer pulse = family.complex(Buffer(family.size, 20000), 2);
    EXPECT_EQ(pulse[0], 32767);
    EXPECT_EQ(pulse[1], 32767);
    const Buffer negative = family.complex(Buffer(family.size, -20000), 0);
    EXPECT_EQ(negative[0], -32768);
    EXPECT_EQ(negative[1], -32768);
  }
}

// ---- Tables ----

TEST(FixedFft, TwiddleTables) {
  const long double step = 2 * std::numbers::pi_v<long double>;
  const auto rounded = [](long double x) { return std::min(std::llround(32768 * x), 32767LL); };
  for (int i = 0; i < 128; ++i) {
    const long double angle = step * i / 256;
    EXPECT_EQ(phs_tbl_WB[2 * i], rounded(std::cos(angle))) << i;
    EXPECT_EQ(phs_tbl_WB[2 * i + 1], rounded(-std::sin(angle))) << i;
    EXPECT_EQ(phs_tbl_256[2 * i], static_cast<int>(32767 * std::cos(angle))) << i;
    EXPECT_EQ(phs_tbl_256[2 * i + 1], static_cast<int>(-32767 * std::sin(angle))) << i;
  }
  for (int i = 0; i < 64; ++i) {
    const long double angle = step * i / 128;
    EXPECT_EQ(phs_tbl_NB[2 * i], rounded(std::cos(angle))) << i;
    EXPECT_EQ(phs_tbl_NB[2 * i + 1], rounded(-std::sin(angle))) << i;
  }
}

TEST(FixedFft, StepTablesAndBandSelection) {
  for (int stage = 0; stage < 7; ++stage) {
    EXPECT_EQ(ii_table_WB[stage], 128 >> stage);
    EXPECT_EQ(ii_table_256[stage], 128 >> stage);
    if (stage < 6) {
      EXPECT_EQ(ii_table_NB[stage], 64 >> stage);
    }
  }
  EXPECT_EQ(phs_tbl[0], phs_tbl_WB);
  EXPECT_EQ(phs_tbl[1], phs_tbl_NB);
  EXPECT_EQ(ii_table[0], ii_table_WB);
  EXPECT_EQ(ii_table[1], ii_table_NB);
}

}  // namespace
}  // namespace orvalis::test
