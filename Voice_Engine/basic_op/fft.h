// What the three transforms share: direction and bit-reversed order.
#pragma once

#include <cstddef>

namespace orvalis {

enum class Direction { kForward, kInverse };

/// Calls swap(i, j) once for each pair of `size` positions, a power of two, that bit reversal
/// exchanges.
template <class Swap>
constexpr void for_each_bit_reversed_pair(std::size_t size, Swap swap) {
  for (std::size_t i = 0, j = 0; i < size; ++i) {
    if (i < j) swap(i, j);
    std::size_t bit = size / 2;  // j counts as i does, but from its highest bit down
    for (; (j & bit) != 0; bit /= 2) j -= bit;
    j += bit;
  }
}

}  // namespace orvalis
