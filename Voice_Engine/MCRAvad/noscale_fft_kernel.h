// The unscaled 64-bit FFTs. Definition, formats and growth: noscale_fft_512p.h.
#pragma once

#include "Voice_Engine/basic_op/word.h"

namespace orvalis {

enum class FftDirection { kForward, kInverse };

/// Swaps x[i] and x[table[i]] of both parts wherever table[i] > i.
template <class Word>
constexpr void bit_reverse(Word32 n, Word *re, Word *im, const Word16 *table) {
  const auto swap = [](Word &a, Word &b) {
    const Word kept = a;
    a = b;
    b = kept;
  };
  for (Word32 i = 0; i < n; ++i) {
    const Word32 j = table[i];
    if (j <= i) continue;
    swap(re[i], re[j]);
    swap(im[i], im[j]);
  }
}

/// In-place complex transform. For 512 and 256 points.
template <int kPoints>
void unscaled_fft(FftDirection direction, Word64 *re, Word64 *im);

/// Spectrum of `length` samples in 1..kPoints, with zeros behind them. For 512 and 256 points.
template <int kPoints>
void unscaled_spectrum(const Word16 *samples, Word32 length, Word32 *re, Word32 *im);

/// In-place complex transform of 32-bit integers. For 512 and 256 points.
template <int kPoints>
void unscaled_fft_of_words(FftDirection direction, Word32 *re, Word32 *im);

}  // namespace orvalis
