// Lanes in plain C++: the judge of all others.
#pragma once

#include "Voice_Engine/basic_op/operators.h"

namespace orvalis::ORVALIS_BODY {

struct Lanes8 {
  static constexpr int kWidth = 8;
  static constexpr bool kMultipliesInOneStep = false;
  struct V {
    Word16 x[8];
  };
  struct V32 {
    Word32 x[8];
  };
  struct Pairs {
    Word16 x[16];
  };

  // --- Memory
  static V load(const Word16 *x) {
    return each([x](int i) { return x[i]; });
  }
  static void store(Word16 *x, const V &v) {
    for (int i = 0; i < 8; ++i) x[i] = v.x[i];
  }
  static V broadcast(Word16 x) {
    return each([x](int) { return x; });
  }

  // --- 16 bits
  static V wrapping_add(const V &a, const V &b) {
    return each([&](int i) { return a.x[i] + b.x[i]; });
  }
  static V wrapping_sub(const V &a, const V &b) {
    return each([&](int i) { return a.x[i] - b.x[i]; });
  }
  static V add(const V &a, const V &b) {
    return each([&](int i) { return saturated(a.x[i] + b.x[i]); });
  }
  static V sub(const V &a, const V &b) {
    return each([&](int i) { return saturated(a.x[i] - b.x[i]); });
  }
  static V min(const V &a, const V &b) {
    return each([&](int i) { return a.x[i] < b.x[i] ? a.x[i] : b.x[i]; });
  }
  static V max(const V &a, const V &b) {
    return each([&](int i) { return a.x[i] > b.x[i] ? a.x[i] : b.x[i]; });
  }
  static V average(const V &a, const V &b) {
    return each([&](int i) { return (a.x[i] + b.x[i] + 1) >> 1; });
  }
  static V greater(const V &a, const V &b) {
    return each([&](int i) { return a.x[i] > b.x[i] ? -1 : 0; });
  }
  static V equal(const V &a, const V &b) {
    return each([&](int i) { return a.x[i] == b.x[i] ? -1 : 0; });
  }
  static V bit_and(const V &a, const V &b) {
    return each([&](int i) { return a.x[i] & b.x[i]; });
  }
  static V bit_xor(const V &a, const V &b) {
    return each([&](int i) { return a.x[i] ^ b.x[i]; });
  }
  static V shift_left(const V &a, int n) {
    return each(
        [&](int i) { return static_cast<Word32>(static_cast<std::uint32_t>(a.x[i]) << n); });
  }
  static V shift_right(const V &a, int n) {
    return each([&](int i) { return a.x[i] >> n; });
  }
  static V mult(const V &a, const V &b) {
    return each([&](int i) { return (a.x[i] * b.x[i]) >> 15; });
  }
  static V mult_r(const V &a, const V &b) {
    return each([&](int i) { return (a.x[i] * b.x[i] + 0x4000) >> 15; });
  }

  // --- Across lanes
  static V reverse(const V &a) {
    return each([&](int i) { return a.x[7 - i]; });
  }
  static Word16 first(const V &a) { return a.x[0]; }
  static Word16 last(const V &a) { return a.x[7]; }
  static Word16 max_lane(const V &a) {
    Word16 most = a.x[0];
    for (const Word16 x : a.x) most = x > most ? x : most;
    return most;
  }
  static void load_deinterleaved(const Word16 *x, V &even, V &odd) {
    even = each([x](int i) { return x[2 * i]; });
    odd = each([x](int i) { return x[2 * i + 1]; });
  }
  static void store_interleaved(Word16 *x, const V &even, const V &odd) {
    for (int i = 0; i < 8; ++i) {
      x[2 * i] = even.x[i];
      x[2 * i + 1] = odd.x[i];
    }
  }
  static void transpose(V (&r)[8]) {
    for (int i = 0; i < 8; ++i) {
      for (int j = 0; j < i; ++j) {
        const Word16 x = r[i].x[j];
        r[i].x[j] = r[j].x[i];
        r[j].x[i] = x;
      }
    }
  }

  // --- Products of pairs, in 32 bits
  static Pairs pairs(const V &first, const V &second) {
    Pairs p;
    store_interleaved(p.x, first, second);
    return p;
  }
  static Pairs load_pairs(const Word16 *x) {
    Pairs p;
    for (int i = 0; i < 16; ++i) p.x[i] = x[i];
    return p;
  }
  static Pairs broadcast_pair(const Word16 *x) { return pairs(broadcast(x[0]), broadcast(x[1])); }
  static V32 dot(const V &a, const V &b, const Pairs &p) {
    return each32(
        [&](int i) { return wrapping_add(a.x[i] * p.x[2 * i], b.x[i] * p.x[2 * i + 1]); });
  }
  static V32 broadcast32(Word32 x) {
    return each32([x](int) { return x; });
  }
  static V32 add32(const V32 &a, const V32 &b) {
    return each32([&](int i) { return wrapping_add(a.x[i], b.x[i]); });
  }
  static V32 sub32(const V32 &a, const V32 &b) {
    return each32([&](int i) { return wrapping_sub(a.x[i], b.x[i]); });
  }
  template <int kPlaces>
  static V32 shift_right32(const V32 &a) {
    return each32([&](int i) { return a.x[i] >> kPlaces; });
  }
  static V narrow(const V32 &a) {
    return each([&](int i) { return saturated(a.x[i]); });
  }
  static void store32(Word32 *x, const V32 &v) {
    for (int i = 0; i < 8; ++i) x[i] = v.x[i];
  }

private:
  static constexpr Word32 saturated(Word32 x) {
    return x > MAX_16 ? MAX_16 : x < MIN_16 ? MIN_16 : x;
  }
  template <class Lane>
  static V each(Lane lane) {
    V v;
    for (int i = 0; i < 8; ++i) v.x[i] = static_cast<Word16>(lane(i));
    return v;
  }
  template <class Lane>
  static V32 each32(Lane lane) {
    V32 v;
    for (int i = 0; i < 8; ++i) v.x[i] = lane(i);
    return v;
  }

  static Word32 wrapping_add(Word32 a, Word32 b) { return orvalis::wrapping_add(a, b); }
  static Word32 wrapping_sub(Word32 a, Word32 b) { return orvalis::wrapping_sub(a, b); }
};

using Wide = Lanes8;

}  // namespace orvalis::ORVALIS_BODY
