// Lanes of SSE2, with the shorter forms where SSSE3 and SSE4.1 come with a wider set, and of AVX2.
#pragma once

#include <immintrin.h>

#include "Voice_Engine/basic_op/word.h"

namespace orvalis::ORVALIS_BODY {

struct Lanes8 {
  static constexpr int kWidth = 8;
#ifdef __SSSE3__
  static constexpr bool kMultipliesInOneStep = true;
#else
  static constexpr bool kMultipliesInOneStep = false;
#endif
  using V = __m128i;
  struct V32 {
    __m128i lo, hi;
  };
  using Pairs = V32;

  // --- Memory
  static V load(const Word16 *x) { return _mm_loadu_si128(reinterpret_cast<const __m128i *>(x)); }
  static void store(Word16 *x, V v) { _mm_storeu_si128(reinterpret_cast<__m128i *>(x), v); }
  static V broadcast(Word16 x) { return _mm_set1_epi16(x); }

  // --- 16 bits
  static V wrapping_add(V a, V b) { return _mm_add_epi16(a, b); }
  static V wrapping_sub(V a, V b) { return _mm_sub_epi16(a, b); }
  static V add(V a, V b) { return _mm_adds_epi16(a, b); }
  static V sub(V a, V b) { return _mm_subs_epi16(a, b); }
  static V min(V a, V b) { return _mm_min_epi16(a, b); }
  static V max(V a, V b) { return _mm_max_epi16(a, b); }
  static V average(V a, V b) {
    const V least = broadcast(MIN_16);  // turns signed numbers into unsigned ones, and back
    return bit_xor(_mm_avg_epu16(bit_xor(a, least), bit_xor(b, least)), least);
  }
  static V greater(V a, V b) { return _mm_cmpgt_epi16(a, b); }
  static V equal(V a, V b) { return _mm_cmpeq_epi16(a, b); }
  static V bit_and(V a, V b) { return _mm_and_si128(a, b); }
  static V bit_xor(V a, V b) { return _mm_xor_si128(a, b); }
  static V shift_left(V a, int n) { return _mm_sll_epi16(a, _mm_cvtsi32_si128(n)); }
  static V shift_right(V a, int n) { return _mm_sra_epi16(a, _mm_cvtsi32_si128(n)); }
  static V mult(V a, V b) {
    return _mm_or_si128(_mm_slli_epi16(_mm_mulhi_epi16(a, b), 1),
                        _mm_srli_epi16(_mm_mullo_epi16(a, b), 15));
  }
  static V mult_r(V a, V b) {
#ifdef __SSSE3__
    return _mm_mulhrs_epi16(a, b);
#else
    // The carry of the rounding is bit 14 of the low half.
    const V low = _mm_mullo_epi16(a, b);
    const V truncated =
        _mm_or_si128(_mm_slli_epi16(_mm_mulhi_epi16(a, b), 1), _mm_srli_epi16(low, 15));
    return _mm_add_epi16(truncated, _mm_and_si128(_mm_srli_epi16(low, 14), _mm_set1_epi16(1)));
#endif
  }

  // --- Across lanes
  static V reverse(V a) {
    const V halves = _mm_shufflehi_epi16(_mm_shufflelo_epi16(a, 0x1B), 0x1B);
    return _mm_shuffle_epi32(halves, 0x4E);
  }
  static Word16 first(V a) { return static_cast<Word16>(_mm_extract_epi16(a, 0)); }
  static Word16 last(V a) { return static_cast<Word16>(_mm_extract_epi16(a, 7)); }
  static Word16 max_lane(V a) {
    a = max(a, _mm_shuffle_epi32(a, 0x4E));
    a = max(a, _mm_shuffle_epi32(a, 0xB1));
    return first(max(a, _mm_shufflelo_epi16(a, 0xB1)));
  }
  static void load_deinterleaved(const Word16 *x, V &even, V &odd) {
    const V a = load(x);
    const V b = load(x + 8);
    even = _mm_packs_epi32(_mm_srai_epi32(_mm_slli_epi32(a, 16), 16),
                           _mm_srai_epi32(_mm_slli_epi32(b, 16), 16));
    odd = _mm_packs_epi32(_mm_srai_epi32(a, 16), _mm_srai_epi32(b, 16));
  }
  static void store_interleaved(Word16 *x, V even, V odd) {
    store(x, _mm_unpacklo_epi16(even, odd));
    store(x + 8, _mm_unpackhi_epi16(even, odd));
  }
  /// Exchanges rows and columns of blocks of eight by eight.
  static void transpose(V (&r)[8]) {
    V a[8];
    V b[8];
    for (int i = 0; i < 4; ++i) {
      a[2 * i] = _mm_unpacklo_epi16(r[2 * i], r[2 * i + 1]);
      a[2 * i + 1] = _mm_unpackhi_epi16(r[2 * i], r[2 * i + 1]);
    }
    for (int i = 0; i < 8; i += 4) {
      for (int j = 0; j < 2; ++j) {
        b[i + 2 * j] = _mm_unpacklo_epi32(a[i + j], a[i + j + 2]);
        b[i + 2 * j + 1] = _mm_unpackhi_epi32(a[i + j], a[i + j + 2]);
      }
    }
    for (int i = 0; i < 4; ++i) {
      r[2 * i] = _mm_unpacklo_epi64(b[i], b[i + 4]);
      r[2 * i + 1] = _mm_unpackhi_epi64(b[i], b[i + 4]);
    }
  }

  // --- Products of pairs, in 32 bits
  static Pairs pairs(V first, V second) {
    return {_mm_unpacklo_epi16(first, second), _mm_unpackhi_epi16(first, second)};
  }
  static Pairs load_pairs(const Word16 *x) { return {load(x), load(x + 8)}; }
  static Pairs broadcast_pair(const Word16 *x) {
    Word32 both;
    __builtin_memcpy(&both, x, sizeof both);
    return {_mm_set1_epi32(both), _mm_set1_epi32(both)};
  }
  /// a * x + b * y for the pairs (x, y).
  static V32 dot(V a, V b, const Pairs &p) {
    return {_mm_madd_epi16(_mm_unpacklo_epi16(a, b), p.lo),
            _mm_madd_epi16(_mm_unpackhi_epi16(a, b), p.hi)};
  }
  static V32 broadcast32(Word32 x) { return {_mm_set1_epi32(x), _mm_set1_epi32(x)}; }
  static V32 add32(V32 a, V32 b) { return {_mm_add_epi32(a.lo, b.lo), _mm_add_epi32(a.hi, b.hi)}; }
  static V32 sub32(V32 a, V32 b) { return {_mm_sub_epi32(a.lo, b.lo), _mm_sub_epi32(a.hi, b.hi)}; }
  template <int kPlaces>
  static V32 shift_right32(V32 a) {
    return {_mm_srai_epi32(a.lo, kPlaces), _mm_srai_epi32(a.hi, kPlaces)};
  }
  /// Saturates.
  static V narrow(V32 a) { return _mm_packs_epi32(a.lo, a.hi); }
  static void store32(Word32 *x, V32 v) {
    _mm_storeu_si128(reinterpret_cast<__m128i *>(x), v.lo);
    _mm_storeu_si128(reinterpret_cast<__m128i *>(x + 4), v.hi);
  }
};

#ifdef __AVX2__

/// Two blocks of eight: most operations do not cross the middle, and lanes of 32 bits are in the
/// order that unpacking leaves.
struct Lanes16 {
  static constexpr int kWidth = 16;
  using V = __m256i;
  struct V32 {
    __m256i lo, hi;
  };
  using Pairs = V32;

  // --- Memory
  static V load(const Word16 *x) {
    return _mm256_loadu_si256(reinterpret_cast<const __m256i *>(x));
  }
  static void store(Word16 *x, V v) { _mm256_storeu_si256(reinterpret_cast<__m256i *>(x), v); }
  static V broadcast(Word16 x) { return _mm256_set1_epi16(x); }

  // --- 16 bits
  static V wrapping_add(V a, V b) { return _mm256_add_epi16(a, b); }
  static V wrapping_sub(V a, V b) { return _mm256_sub_epi16(a, b); }
  static V add(V a, V b) { return _mm256_adds_epi16(a, b); }
  static V sub(V a, V b) { return _mm256_subs_epi16(a, b); }
  static V min(V a, V b) { return _mm256_min_epi16(a, b); }
  static V max(V a, V b) { return _mm256_max_epi16(a, b); }
  static V average(V a, V b) {
    const V least = broadcast(MIN_16);
    return bit_xor(_mm256_avg_epu16(bit_xor(a, least), bit_xor(b, least)), least);
  }
  static V greater(V a, V b) { return _mm256_cmpgt_epi16(a, b); }
  static V equal(V a, V b) { return _mm256_cmpeq_epi16(a, b); }
  static V bit_and(V a, V b) { return _mm256_and_si256(a, b); }
  static V bit_xor(V a, V b) { return _mm256_xor_si256(a, b); }
  static V shift_left(V a, int n) { return _mm256_sll_epi16(a, _mm_cvtsi32_si128(n)); }
  static V shift_right(V a, int n) { return _mm256_sra_epi16(a, _mm_cvtsi32_si128(n)); }
  static V mult(V a, V b) {
    return _mm256_or_si256(_mm256_slli_epi16(_mm256_mulhi_epi16(a, b), 1),
                           _mm256_srli_epi16(_mm256_mullo_epi16(a, b), 15));
  }
  static V mult_r(V a, V b) { return _mm256_mulhrs_epi16(a, b); }

  // --- Across lanes
  static V reverse(V a) {
    const V order = _mm256_broadcastsi128_si256(
        _mm_setr_epi8(14, 15, 12, 13, 10, 11, 8, 9, 6, 7, 4, 5, 2, 3, 0, 1));
    return exchange(_mm256_shuffle_epi8(a, order));
  }
  static Word16 last(V a) { return static_cast<Word16>(_mm256_extract_epi16(a, 15)); }
  static Word16 max_lane(V a) {
    return Lanes8::max_lane(Lanes8::max(_mm256_castsi256_si128(a), _mm256_extracti128_si256(a, 1)));
  }
  /// (a, b) become (lower halves, upper halves); done twice, nothing has changed.
  static void exchange_halves(V &a, V &b) {
    const V lower = _mm256_permute2x128_si256(a, b, 0x20);
    b = _mm256_permute2x128_si256(a, b, 0x31);
    a = lower;
  }
  static void load_deinterleaved(const Word16 *x, V &even, V &odd) {
    const V a = load(x);
    const V b = load(x + 16);
    even = in_order(_mm256_packs_epi32(_mm256_srai_epi32(_mm256_slli_epi32(a, 16), 16),
                                       _mm256_srai_epi32(_mm256_slli_epi32(b, 16), 16)));
    odd = in_order(_mm256_packs_epi32(_mm256_srai_epi32(a, 16), _mm256_srai_epi32(b, 16)));
  }
  static void store_interleaved(Word16 *x, V even, V odd) {
    V a = _mm256_unpacklo_epi16(even, odd);
    V b = _mm256_unpackhi_epi16(even, odd);
    exchange_halves(a, b);
    store(x, a);
    store(x + 16, b);
  }
  static void transpose(V (&r)[8]) {
    V a[8];
    V b[8];
    for (int i = 0; i < 4; ++i) {
      a[2 * i] = _mm256_unpacklo_epi16(r[2 * i], r[2 * i + 1]);
      a[2 * i + 1] = _mm256_unpackhi_epi16(r[2 * i], r[2 * i + 1]);
    }
    for (int i = 0; i < 8; i += 4) {
      for (int j = 0; j < 2; ++j) {
        b[i + 2 * j] = _mm256_unpacklo_epi32(a[i + j], a[i + j + 2]);
        b[i + 2 * j + 1] = _mm256_unpackhi_epi32(a[i + j], a[i + j + 2]);
      }
    }
    for (int i = 0; i < 4; ++i) {
      r[2 * i] = _mm256_unpacklo_epi64(b[i], b[i + 4]);
      r[2 * i + 1] = _mm256_unpackhi_epi64(b[i], b[i + 4]);
    }
  }

  // --- Products of pairs, in 32 bits
  static Pairs pairs(V first, V second) {
    return {_mm256_unpacklo_epi16(first, second), _mm256_unpackhi_epi16(first, second)};
  }
  static Pairs load_pairs(const Word16 *x) { return {load(x), load(x + 16)}; }
  static Pairs broadcast_pair(const Word16 *x) {
    Word32 both;
    __builtin_memcpy(&both, x, sizeof both);
    return {_mm256_set1_epi32(both), _mm256_set1_epi32(both)};
  }
  static V32 dot(V a, V b, const Pairs &p) {
    return {_mm256_madd_epi16(_mm256_unpacklo_epi16(a, b), p.lo),
            _mm256_madd_epi16(_mm256_unpackhi_epi16(a, b), p.hi)};
  }
  static V32 broadcast32(Word32 x) { return {_mm256_set1_epi32(x), _mm256_set1_epi32(x)}; }
  static V32 add32(V32 a, V32 b) {
    return {_mm256_add_epi32(a.lo, b.lo), _mm256_add_epi32(a.hi, b.hi)};
  }
  static V32 sub32(V32 a, V32 b) {
    return {_mm256_sub_epi32(a.lo, b.lo), _mm256_sub_epi32(a.hi, b.hi)};
  }
  template <int kPlaces>
  static V32 shift_right32(V32 a) {
    return {_mm256_srai_epi32(a.lo, kPlaces), _mm256_srai_epi32(a.hi, kPlaces)};
  }
  static V narrow(V32 a) { return _mm256_packs_epi32(a.lo, a.hi); }
  static void store32(Word32 *x, V32 v) {
    exchange_halves(v.lo, v.hi);
    _mm256_storeu_si256(reinterpret_cast<__m256i *>(x), v.lo);
    _mm256_storeu_si256(reinterpret_cast<__m256i *>(x + 8), v.hi);
  }

private:
  static V exchange(V a) { return _mm256_permute4x64_epi64(a, 0x4E); }
  static V in_order(V a) { return _mm256_permute4x64_epi64(a, 0xD8); }
};

using Wide = Lanes16;
#else
using Wide = Lanes8;
#endif

}  // namespace orvalis::ORVALIS_BODY
