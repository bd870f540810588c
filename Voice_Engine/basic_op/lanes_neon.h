// Lanes of NEON (AArch64).
#pragma once

#include <arm_neon.h>

#include "Voice_Engine/basic_op/word.h"

namespace orvalis::ORVALIS_BODY {

struct Lanes8 {
  static constexpr int kWidth = 8;
  static constexpr bool kMultipliesInOneStep = false;
  using V = int16x8_t;
  struct V32 {
    int32x4_t lo, hi;
  };
  using Pairs = int16x8x2_t;

  // --- Memory
  static V load(const Word16 *x) { return vld1q_s16(x); }
  static void store(Word16 *x, V v) { vst1q_s16(x, v); }
  static V broadcast(Word16 x) { return vdupq_n_s16(x); }

  // --- 16 bits
  static V wrapping_add(V a, V b) { return vaddq_s16(a, b); }
  static V wrapping_sub(V a, V b) { return vsubq_s16(a, b); }
  static V add(V a, V b) { return vqaddq_s16(a, b); }
  static V sub(V a, V b) { return vqsubq_s16(a, b); }
  static V min(V a, V b) { return vminq_s16(a, b); }
  static V max(V a, V b) { return vmaxq_s16(a, b); }
  static V average(V a, V b) { return vrhaddq_s16(a, b); }
  static V greater(V a, V b) { return vreinterpretq_s16_u16(vcgtq_s16(a, b)); }
  static V equal(V a, V b) { return vreinterpretq_s16_u16(vceqq_s16(a, b)); }
  static V bit_and(V a, V b) { return vandq_s16(a, b); }
  static V bit_xor(V a, V b) { return veorq_s16(a, b); }
  static V shift_left(V a, int n) { return vshlq_s16(a, broadcast(static_cast<Word16>(n))); }
  static V shift_right(V a, int n) { return vshlq_s16(a, broadcast(static_cast<Word16>(-n))); }
  static V mult(V a, V b) { return vqdmulhq_s16(a, b); }
  static V mult_r(V a, V b) { return vqrdmulhq_s16(a, b); }

  // --- Across lanes
  static V reverse(V a) {
    const V halves = vrev64q_s16(a);
    return vextq_s16(halves, halves, 4);
  }
  static Word16 first(V a) { return vgetq_lane_s16(a, 0); }
  static Word16 last(V a) { return vgetq_lane_s16(a, 7); }
  static Word16 max_lane(V a) { return vmaxvq_s16(a); }
  static void load_deinterleaved(const Word16 *x, V &even, V &odd) {
    const int16x8x2_t both = vld2q_s16(x);
    even = both.val[0];
    odd = both.val[1];
  }
  static void store_interleaved(Word16 *x, V even, V odd) { vst2q_s16(x, {{even, odd}}); }
  static void transpose(V (&r)[8]) {
    V a[8];
    V b[8];
    for (int i = 0; i < 8; i += 2) {
      a[i] = vtrn1q_s16(r[i], r[i + 1]);
      a[i + 1] = vtrn2q_s16(r[i], r[i + 1]);
    }
    const auto as32 = [](V v) { return vreinterpretq_s32_s16(v); };
    const auto as64 = [](V v) { return vreinterpretq_s64_s16(v); };
    for (int k = 0; k < 4; ++k) {
      const int i = k + (k & 2);
      b[i] = vreinterpretq_s16_s32(vtrn1q_s32(as32(a[i]), as32(a[i + 2])));
      b[i + 2] = vreinterpretq_s16_s32(vtrn2q_s32(as32(a[i]), as32(a[i + 2])));
    }
    for (int i = 0; i < 4; ++i) {
      r[i] = vreinterpretq_s16_s64(vtrn1q_s64(as64(b[i]), as64(b[i + 4])));
      r[i + 4] = vreinterpretq_s16_s64(vtrn2q_s64(as64(b[i]), as64(b[i + 4])));
    }
  }

  // --- Products of pairs, in 32 bits
  static Pairs pairs(V first, V second) { return {{first, second}}; }
  static Pairs load_pairs(const Word16 *x) { return vld2q_s16(x); }
  static Pairs broadcast_pair(const Word16 *x) { return pairs(broadcast(x[0]), broadcast(x[1])); }
  static V32 dot(V a, V b, const Pairs &p) {
    const int32x4_t lo = vmull_s16(vget_low_s16(a), vget_low_s16(p.val[0]));
    const int32x4_t hi = vmull_high_s16(a, p.val[0]);
    return {vmlal_s16(lo, vget_low_s16(b), vget_low_s16(p.val[1])),
            vmlal_high_s16(hi, b, p.val[1])};
  }
  static V32 broadcast32(Word32 x) { return {vdupq_n_s32(x), vdupq_n_s32(x)}; }
  static V32 add32(V32 a, V32 b) { return {vaddq_s32(a.lo, b.lo), vaddq_s32(a.hi, b.hi)}; }
  static V32 sub32(V32 a, V32 b) { return {vsubq_s32(a.lo, b.lo), vsubq_s32(a.hi, b.hi)}; }
  template <int kPlaces>
  static V32 shift_right32(V32 a) {
    return {vshrq_n_s32(a.lo, kPlaces), vshrq_n_s32(a.hi, kPlaces)};
  }
  static V narrow(V32 a) { return vqmovn_high_s32(vqmovn_s32(a.lo), a.hi); }
  static void store32(Word32 *x, V32 v) {
    vst1q_s32(x, v.lo);
    vst1q_s32(x + 4, v.hi);
  }
};

using Wide = Lanes8;

}  // namespace orvalis::ORVALIS_BODY
