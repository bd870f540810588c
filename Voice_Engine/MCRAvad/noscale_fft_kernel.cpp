#include "Voice_Engine/MCRAvad/noscale_fft_kernel.h"

#include <array>
#include <numeric>
#include <utility>

#include "Voice_Engine/MCRAvad/wide_arithmetic.h"
#include "Voice_Engine/basic_op/constexpr_math.h"
#include "Voice_Engine/basic_op/hidden_table.h"

namespace {

using orvalis::Word16;
using orvalis::Word32;
using orvalis::Word64;

template <std::size_t kPoints>
using SineTable = std::array<Word32, kPoints>;
template <std::size_t kPoints>
using ReversalTable = std::array<Word16, kPoints>;

/// To Q31 by way of six decimals and single precision, as bit-exact results need it.
constexpr Word32 sine_entry(double sine) {
  const double millionths = sine * 1e6;
  const auto rounded = static_cast<Word32>(millionths < 0 ? millionths - 0.5 : millionths + 0.5);
  if (rounded == 1000000) return orvalis::MAX_32;
  return static_cast<Word32>(static_cast<float>(rounded / 1e6) * 0x1p31f);
}

template <std::size_t kPoints>
constexpr SineTable<kPoints> make_sines() {
  SineTable<kPoints> table{};
  for (std::size_t i = 0; i < kPoints; ++i) {
    const auto position = static_cast<double>(i);
    table[i] = sine_entry(orvalis::constexpr_math::sin_of_turn(position, kPoints));
  }
  return table;
}

template <std::size_t kPoints>
constexpr ReversalTable<kPoints> make_reversal() {
  ReversalTable<kPoints> table{};
  std::iota(table.begin(), table.end(), Word16{0});
  orvalis::for_each_bit_reversed_pair(
      kPoints, [&table](std::size_t i, std::size_t j) { std::swap(table[i], table[j]); });
  return table;
}

using Sines512 = SineTable<512>;
using Sines256 = SineTable<256>;
using Reversal512 = ReversalTable<512>;
using Reversal256 = ReversalTable<256>;

}  // namespace

ORVALIS_HIDDEN_TABLE(Sines512, sin_table_fft_512_noscale) = make_sines<512>();
ORVALIS_HIDDEN_TABLE(Sines256, sin_table_fft_256_noscale) = make_sines<256>();
ORVALIS_HIDDEN_TABLE(Reversal512, fix_bitrev_512) = make_reversal<512>();
ORVALIS_HIDDEN_TABLE(Reversal256, fix_bitrev_256) = make_reversal<256>();

ORVALIS_EXPORT_TABLE(Sines512, sin_table_fft_512_noscale);
ORVALIS_EXPORT_TABLE(Sines256, sin_table_fft_256_noscale);
ORVALIS_EXPORT_TABLE(Reversal512, fix_bitrev_512);
ORVALIS_EXPORT_TABLE(Reversal256, fix_bitrev_256);

namespace orvalis {
namespace {

/// Size and tables of one transform.
struct UnscaledPlan {
  int log2_points;
  const Word32 *sines;
  const Word16 *reversal;
};

template <int kPoints>
UnscaledPlan plan_of() {
  if constexpr (kPoints == 512) {
    return {9, orvalis_sin_table_fft_512_noscale.data(), orvalis_fix_bitrev_512.data()};
  } else {
    static_assert(kPoints == 256);
    return {8, orvalis_sin_table_fft_256_noscale.data(), orvalis_fix_bitrev_256.data()};
  }
}

/// The twiddle factor cosine - i * sine.
struct Twiddle {
  Word32 cosine;
  Word32 sine;
};

/// x[j] becomes x[i] - x[j] * w, x[i] becomes x[i] + x[j] * w.
inline void butterfly(Word64 *re, Word64 *im, int i, int j, Twiddle w) {
  const Word64 product_re =
      wrapping_add(L64_mult_q31(im[j], w.sine), L64_mult_q31(re[j], w.cosine));
  const Word64 product_im =
      wrapping_sub(L64_mult_q31(im[j], w.cosine), L64_mult_q31(re[j], w.sine));
  re[j] = wrapping_sub(re[i], product_re);
  re[i] = wrapping_add(re[i], product_re);
  im[j] = wrapping_sub(im[i], product_im);
  im[i] = wrapping_add(im[i], product_im);
}

/// x / 2^shift, rounded half up.
constexpr Word64 rounded_shift(Word64 x, int shift) {
  return (x >> shift) + ((x >> (shift - 1)) & 1);
}

/// The low 32 bits of the integer that x in Q32 is nearest to, half up.
constexpr Word32 rounded_integer(Word64 x) { return static_cast<Word32>(rounded_shift(x, 32)); }

constexpr Word64 q32(Word32 x) { return x * (Word64{1} << 32); }

template <int kPoints>
struct WorkingArrays {
  Word64 re[kPoints] = {};
  Word64 im[kPoints] = {};

  void round_to(Word32 *re_out, Word32 *im_out) const {
    for (int k = 0; k < kPoints; ++k) {
      re_out[k] = rounded_integer(re[k]);
      im_out[k] = rounded_integer(im[k]);
    }
  }
};

}  // namespace

template <int kPoints>
void unscaled_fft(Direction direction, Word64 *re, Word64 *im) {
  const UnscaledPlan plan = plan_of<kPoints>();
  const bool inverse = direction == Direction::kInverse;
  reorder(kPoints, re, im, plan.reversal);
  int step = kPoints / 2;
  for (int half = 1; half < kPoints; half *= 2, step /= 2) {
    for (int k = 0; k < half; ++k) {
      // Sines of the first half turn are not negative, so they can be negated.
      const Word32 sine = plan.sines[k * step];
      const Word32 cosine = plan.sines[k * step + kPoints / 4];
      for (int i = k; i < kPoints; i += 2 * half) {
        butterfly(re, im, i, i + half, {cosine, inverse ? -sine : sine});
      }
    }
  }
  if (!inverse) return;
  for (int i = 0; i < kPoints; ++i) {
    re[i] = rounded_shift(re[i], plan.log2_points);
    im[i] = rounded_shift(im[i], plan.log2_points);
  }
}

template <int kPoints>
void unscaled_spectrum(const Word16 *samples, Word32 length, Word32 *re, Word32 *im) {
  WorkingArrays<kPoints> work;
  for (Word32 i = 0; i < length; ++i) work.re[i] = q32(samples[i]);
  unscaled_fft<kPoints>(Direction::kForward, work.re, work.im);
  work.round_to(re, im);
}

template <int kPoints>
void unscaled_fft_of_words(Direction direction, Word32 *re, Word32 *im) {
  WorkingArrays<kPoints> work;
  for (int i = 0; i < kPoints; ++i) {
    work.re[i] = q32(re[i]);
    work.im[i] = q32(im[i]);
  }
  unscaled_fft<kPoints>(direction, work.re, work.im);
  work.round_to(re, im);
}

template void unscaled_fft<512>(Direction, Word64 *, Word64 *);
template void unscaled_fft<256>(Direction, Word64 *, Word64 *);
template void unscaled_spectrum<512>(const Word16 *, Word32, Word32 *, Word32 *);
template void unscaled_spectrum<256>(const Word16 *, Word32, Word32 *, Word32 *);
template void unscaled_fft_of_words<256>(Direction, Word32 *, Word32 *);

}  // namespace orvalis
