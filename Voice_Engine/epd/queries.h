// Stateless queries about a block of samples: its energy in dB, its spectrum.
#pragma once

#include "Voice_Engine/basic_op/flags.h"

namespace orvalis {

/// 10 log10 of the variance of n samples, truncated to whole dB, at least 0.
Word32 block_energy_db(const Word16 *x, Word32 n);

/// Samples of a block of 20 ms; below 1 where a rate is too low to have one.
constexpr Word32 energy_block_samples(Word32 rate_hz) {
  return static_cast<Word32>(rate_hz * 0.02);
}

/// The maximum of block_energy_db over blocks of 20 ms; the last one is read whole. 0 if n or the
/// block length is below 1.
Word32 largest_energy_db(const Word16 *x, Word32 n, Word32 rate_hz);

/// Power spectrum 2 re^2 + 2 im^2 of one frame of sample pairs: 128 bins of 160 samples for flag 0,
/// 64 bins of 80 samples for any other. Returns 1.
Word32 getFrameSpectrum(Flags &flags, const Word16 *x, Word32 *out, Word32 flag);

}  // namespace orvalis
