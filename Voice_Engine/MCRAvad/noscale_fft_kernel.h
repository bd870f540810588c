// The unscaled 64-bit FFTs. Definition, formats and growth: noscale_fft_512p.h.
#pragma once

#include <utility>

#include "Voice_Engine/basic_op/fft.h"
#include "Voice_Engine/basic_op/word.h"

namespace orvalis {

/// Swaps x[i] and x[table[i]] of both parts wherever table[i] > i.
template <class Word>
constexpr void reorder(Word32 n, Word *re, Word *im, const Word16 *table) {
  for (Word32 i = 0; i < n; ++i) {
    const Word32 j = table[i];
    if (j <= i) continue;
    std::swap(re[i], re[j]);
    std::swap(im[i], im[j]);
  }
}

/// In-place complex transform. For 512 and 256 points.
template <int kPoints>
void unscaled_fft(Direction direction, Word64 *re, Word64 *im);

/// Spectrum of `length` samples in 1..kPoints, with zeros behind them. For 512 and 256 points.
template <int kPoints>
void unscaled_spectrum(const Word16 *samples, Word32 length, Word32 *re, Word32 *im);

/// In-place complex transform of 32-bit integers. For 512 and 256 points.
template <int kPoints>
void unscaled_fft_of_words(Direction direction, Word32 *re, Word32 *im);

}  // namespace orvalis
