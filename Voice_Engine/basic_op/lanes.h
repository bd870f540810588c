// Lanes of 16 bits: the operations that kernels are written in, once for every instruction set.
//
// A kernel is a template over one of these structs. Lanes8 exists in every set; Wide is the widest
// there is, Lanes8 or Lanes16. The build compiles the kernels once for each set, with ORVALIS_BODY
// as the namespace, so that no two sets share a function.
//
//   V       kWidth values of 16 bits       add, sub saturate, wrapping_... do not
//   V32     one 32-bit value for each      dot, add32 ... wrap; narrow saturates
//   Pairs   two factors for each           first and second in turn in memory; Lanes16 expects
//                                          those of lanes 8..11 before those of lanes 4..7
//
// average is (a + b + 1) / 2, rounded down and never overflowing. mult and mult_r are the operators
// of that name, for factors that are not both the least value. Where kMultipliesInOneStep holds,
// mult_r is one instruction, worth a vector for a single value. Masks are 0 or -1. Shifts of 16
// bits are 0..15 places.
#pragma once

#if !defined(ORVALIS_BODY) || !defined(ORVALIS_LANES)
#error "compiled for one instruction set at a time: see Voice_Engine/bodies"
#endif

#include ORVALIS_LANES

namespace orvalis::ORVALIS_BODY {

template <class L>
using V = typename L::V;
template <class L>
using V32 = typename L::V32;
template <class L>
using Pairs = typename L::Pairs;

template <class L>
inline V<L> negate(V<L> x) {
  return L::sub(L::broadcast(0), x);
}

template <class L>
inline V<L> abs_s(V<L> x) {
  return L::max(x, negate<L>(x));
}

/// The rounding shift of all lanes by the same number of places, left for n >= 0.
template <class L>
inline V<L> shift_r(V<L> x, Word32 n) {
  if (n >= 0) {
    const int places = n < 15 ? n : 15;
    const V<L> shifted = L::shift_left(x, places);
    const V<L> kept = L::equal(L::shift_right(shifted, places), x);
    const V<L> limit = L::bit_xor(L::shift_right(x, 15), L::broadcast(MAX_16));
    return L::bit_xor(limit, L::bit_and(kept, L::bit_xor(limit, shifted)));
  }
  const int places = -n < 16 ? -n : 16;
  const V<L> before_last = L::shift_right(x, places - 1);
  return L::wrapping_add(L::shift_right(before_last, 1), L::bit_and(before_last, L::broadcast(1)));
}

/// The same where a shift to the left loses nothing, as with the one that normalises a block.
template <class L>
inline V<L> normalise(V<L> x, Word32 n) {
  return n >= 0 ? L::shift_left(x, n) : shift_r<L>(x, n);
}

/// Undoes a block shift on sign and magnitude, so that both signs truncate toward zero: shifts left
/// for n > 0, saturating.
template <class L>
inline V<L> shift_magnitude(V<L> x, Word32 n) {
  const V<L> sign = L::shift_right(x, 15);
  const V<L> magnitude =
      n > 0 ? shift_r<L>(abs_s<L>(x), n) : L::shift_right(abs_s<L>(x), -n < 15 ? -n : 15);
  return L::wrapping_sub(L::bit_xor(magnitude, sign), sign);
}

/// The largest saturated magnitude of so many samples, a multiple of the width.
template <class L>
inline Word16 largest_magnitude(const Word16 *x, int samples) {
  V<L> most = L::broadcast(0);
  for (int i = 0; i < samples; i += L::kWidth) most = L::max(most, abs_s<L>(L::load(x + i)));
  return L::max_lane(most);
}

/// Counts the lanes in which masks are set.
template <class L>
class Count {
public:
  void add(V<L> mask) { counts_ = L::wrapping_sub(counts_, mask); }
  int total() const {
    Word16 counts[L::kWidth];
    L::store(counts, counts_);
    int total = 0;
    for (const Word16 count : counts) total += count;
    return total;
  }

private:
  V<L> counts_ = L::broadcast(0);
};

}  // namespace orvalis::ORVALIS_BODY
