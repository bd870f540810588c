// Block floating point: one shift for a whole block of 16-bit samples. Source: TIA IS-127.
#pragma once

#include "Voice_Engine/basic_op/operators.h"

namespace orvalis {

/// The largest saturated magnitude in `length` samples, at least `floor`.
constexpr Word16 largest_magnitude(const Word16 *data, Word32 length, Word16 floor) {
  for (Word32 i = 0; i < length; ++i) {
    const Word16 magnitude = abs_s(data[i]);
    if (magnitude > floor) floor = magnitude;
  }
  return floor;
}

/// Shifts a block in place, rounding, so that its largest sample keeps `headroom` spare bits.
/// Returns the shift, left where positive; -headroom for a block of zeros.
/// data[0] is read even where length < 1.
inline Word16 block_norm_AL(Flags &flags, Word16 *data, Word32 length, Word16 headroom) {
  const Word16 largest = largest_magnitude(data, length, abs_s(data[0]));
  const Word16 shift = sub(flags, norm_s(largest), headroom);
  for (Word32 i = 0; i < length; ++i) data[i] = shift_r(flags, data[i], shift);
  return shift;
}

/// The same over two blocks with one common shift, truncating instead of rounding.
inline Word16 block_norm2(Flags &flags, Word16 *a, Word16 *b, Word32 length, Word16 headroom) {
  const Word16 largest = largest_magnitude(b, length, largest_magnitude(a, length, 0));
  const Word16 shift = sub(flags, norm_s(largest), headroom);
  for (Word32 i = 0; i < length; ++i) a[i] = shl(flags, a[i], shift);
  for (Word32 i = 0; i < length; ++i) b[i] = shl(flags, b[i], shift);
  return shift;
}

/// Undoes a block shift on sign and magnitude, so that both signs truncate toward zero.
inline void block_denorm_AL(Flags &flags, Word16 *data, Word32 length, Word16 shift) {
  for (Word32 i = 0; i < length; ++i) {
    const Word16 magnitude = shl(flags, abs_s(data[i]), -shift);
    data[i] = data[i] < 0 ? negate(magnitude) : magnitude;
  }
}

}  // namespace orvalis
