// The exported operators: one line for each, forwarding to the inline operator with the flags of
// its copy.
#include "Voice_Engine/basic_op/basic_op.h"
#include "Voice_Engine/basic_op/block_scaling.h"
#include "Voice_Engine/basic_op/complex_product.h"
#include "Voice_Engine/basic_op/double_precision.h"
#include "Voice_Engine/basic_op/log_exp.h"
#include "Voice_Engine/basic_op/operators.h"
#include "Voice_Engine/basic_op/zolt_operators.h"

using orvalis::NsCopy;
using orvalis::PlainCopy;
using orvalis::PublishedFlags;
using orvalis::Word16;
using orvalis::Word32;
using orvalis::ZoltCopy;

#define EXPORTED extern "C" ORVALIS_EXPORT

// An operator that touches no flag.
#define PURE(result, name, op, parameters, ...) \
  EXPORTED result name parameters { return orvalis::op(__VA_ARGS__); }

// An operator that reports to the flags of its copy.
#define REPORTING(copy, result, name, op, parameters, ...) \
  EXPORTED result name parameters {                        \
    PublishedFlags<copy> flags;                            \
    return orvalis::op(*flags, __VA_ARGS__);               \
  }

// The plain and the ns_ copy of one operator.
#define BOTH_PURE(result, op, ns_name, parameters, ...) \
  PURE(result, op, op, parameters, __VA_ARGS__)         \
  PURE(result, ns_name, op, parameters, __VA_ARGS__)
#define BOTH(result, op, ns_name, parameters, ...)              \
  REPORTING(PlainCopy, result, op, op, parameters, __VA_ARGS__) \
  REPORTING(NsCopy, result, ns_name, op, parameters, __VA_ARGS__)

// clang-format off
BOTH_PURE(Word16, abs_s,       ns_abs_s,       (Word16 x), x)
BOTH_PURE(Word16, negate,      ns_negate,      (Word16 x), x)
BOTH_PURE(Word16, extract_h,   ns_extract_h,   (Word32 x), x)
BOTH_PURE(Word16, extract_l,   ns_extract_l,   (Word32 x), x)
BOTH_PURE(Word32, L_deposit_h, ns_L_deposit_h, (Word16 x), x)
BOTH_PURE(Word32, L_deposit_l, ns_L_deposit_l, (Word16 x), x)
BOTH_PURE(Word32, L_abs,       ns_L_abs,       (Word32 x), x)
BOTH_PURE(Word32, L_negate,    L_ns_negate,    (Word32 x), x)
BOTH_PURE(Word16, norm_s,      ns_norm_s,      (Word16 x), x)
BOTH_PURE(Word16, norm_l,      ns_norm_l,      (Word32 x), x)

BOTH(Word16, sature,    ns_sature,    (Word32 x), x)
BOTH(Word16, add,       ns_add,       (Word16 a, Word16 b), a, b)
BOTH(Word16, sub,       ns_sub,       (Word16 a, Word16 b), a, b)
BOTH(Word16, mult,      ns_mult,      (Word16 a, Word16 b), a, b)
BOTH(Word16, mult_r,    ns_mult_r,    (Word16 a, Word16 b), a, b)
BOTH(Word16, shl,       ns_shl,       (Word16 x, Word16 n), x, n)
BOTH(Word16, shr,       ns_shr,       (Word16 x, Word16 n), x, n)
BOTH(Word16, shr_r,     ns_shr_r,     (Word16 x, Word16 n), x, n)
BOTH(Word16, shift_r,   ns_shift_r,   (Word16 x, Word16 n), x, n)
BOTH(Word32, L_add,     L_ns_add,     (Word32 a, Word32 b), a, b)
BOTH(Word32, L_sub,     L_ns_sub,     (Word32 a, Word32 b), a, b)
BOTH(Word32, L_mult,    L_ns_mult,    (Word16 a, Word16 b), a, b)
BOTH(Word32, L_mac,     ns_L_mac,     (Word32 sum, Word16 a, Word16 b), sum, a, b)
BOTH(Word32, L_msu,     ns_L_msu,     (Word32 sum, Word16 a, Word16 b), sum, a, b)
BOTH(Word16, round_BOP, ns_round,     (Word32 x), x)
BOTH(Word16, mac_r,     ns_mac_r,     (Word32 sum, Word16 a, Word16 b), sum, a, b)
BOTH(Word16, msu_r,     ns_msu_r,     (Word32 sum, Word16 a, Word16 b), sum, a, b)
BOTH(Word32, L_add_c,   L_ns_add_c,   (Word32 a, Word32 b), a, b)
BOTH(Word32, L_sub_c,   L_ns_sub_c,   (Word32 a, Word32 b), a, b)
BOTH(Word32, L_macNs,   ns_L_macNs,   (Word32 sum, Word16 a, Word16 b), sum, a, b)
BOTH(Word32, L_msuNs,   ns_L_msuNs,   (Word32 sum, Word16 a, Word16 b), sum, a, b)
BOTH(Word32, L_sat,     ns_L_sat,     (Word32 x), x)
BOTH(Word32, L_shl,     L_ns_shl,     (Word32 x, Word16 n), x, n)
BOTH(Word32, L_shr,     L_ns_shr,     (Word32 x, Word16 n), x, n)
BOTH(Word32, L_shr_r,   L_ns_shr_r,   (Word32 x, Word16 n), x, n)
BOTH(Word16, div_s,     ns_div_s,     (Word16 a, Word16 b), a, b)
BOTH(Word32, L_mpy_ll,  ns_L_mpy_ll,  (Word32 a, Word32 b), a, b)
BOTH(Word32, L_mpy_ls,  ns_L_mpy_ls,  (Word32 a, Word16 b), a, b)
BOTH(Word32, L_divide,  ns_L_divide,  (Word32 a, Word32 b), a, b)

BOTH(Word32, C2PREAL_SS, NS_C2PREAL_SS, (Word16 ar, Word16 ai, Word16 br, Word16 bi), ar, ai, br, bi)
BOTH(Word32, C2PIMAG_SS, NS_C2PIMAG_SS, (Word16 ar, Word16 ai, Word16 br, Word16 bi), ar, ai, br, bi)
BOTH(Word32, C2PREAL_LS, NS_C2PREAL_LS, (Word32 ar, Word32 ai, Word16 br, Word16 bi), ar, ai, br, bi)
BOTH(Word32, C2PIMAG_LS, NS_C2PIMAG_LS, (Word32 ar, Word32 ai, Word16 br, Word16 bi), ar, ai, br, bi)
BOTH(Word32, C3PREAL,    NS_C3PREAL,    (Word32 ar, Word32 ai, Word32 br, Word32 bi, Word32 cr, Word32 ci), {ar, ai}, {br, bi}, {cr, ci})
BOTH(Word32, C3PIMAG,    NS_C3PIMAG,    (Word32 ar, Word32 ai, Word32 br, Word32 bi, Word32 cr, Word32 ci), {ar, ai}, {br, bi}, {cr, ci})

BOTH(Word16, block_norm_AL,   ns_cblock_norm,  (Word16 *data, Word16 length, Word16 headroom), data, length, headroom)
BOTH(Word16, block_norm2,     ns_cblock_norm2, (Word16 *a, Word16 *b, Word16 length, Word16 headroom), a, b, length, headroom)
BOTH(void,   block_denorm_AL, ns_block_denorm, (Word16 *data, Word16 length, Word16 shift), data, length, shift)

BOTH(Word32, fnLog2,  ns_fnLog2,  (Word32 x), x)
BOTH(Word32, fnLog10, ns_fnLog10, (Word32 x), x)
BOTH(Word32, fnExp2,  ns_fnExp2,  (Word32 x), x)
BOTH(Word32, fnExp10, ns_fnExp10, (Word32 x), x)
BOTH(Word16, sqroot,  ns_sqroot,  (Word32 x), x)
BOTH(Word32, L_Comp,  ns_L_Comp,  (Word16 hi, Word16 lo), {hi, lo})

REPORTING(PlainCopy, Word32, Mpy_32,    Mpy_32,    (Word16 a_hi, Word16 a_lo, Word16 b_hi, Word16 b_lo), {a_hi, a_lo}, {b_hi, b_lo})
REPORTING(PlainCopy, Word32, Mpy_32_16, Mpy_32_16, (Word16 a_hi, Word16 a_lo, Word16 b), {a_hi, a_lo}, b)
REPORTING(PlainCopy, Word32, Div_32,    Div_32,    (Word32 a, Word16 b_hi, Word16 b_lo), a, {b_hi, b_lo})

PURE(Word16, ZOLT_abs_s,       abs_s,       (Word16 x), x)
PURE(Word16, ZOLT_negate,      negate,      (Word16 x), x)
PURE(Word16, ZOLT_extract_h,   extract_h,   (Word32 x), x)
PURE(Word16, ZOLT_extract_l,   extract_l,   (Word32 x), x)
PURE(Word32, ZOLT_L_negate,    L_negate,    (Word32 x), x)
PURE(Word32, ZOLT_L_abs,       L_abs,       (Word32 x), x)
PURE(Word32, ZOLT_L_deposit_h, L_deposit_h, (Word16 x), x)
PURE(Word32, ZOLT_L_deposit_l, L_deposit_l, (Word16 x), x)
PURE(Word16, ZOLT_norm_s,      norm_s,      (Word16 x), x)
PURE(Word16, ZOLT_norm_l,      norm_l,      (Word32 x), x)
PURE(Word16, ZOLT_expadj_s,    expadj_s,    (Word16 x, Word16 max_shift), x, max_shift)
PURE(Word16, ZOLT_div_l,       div_l,       (Word32 a, Word16 b), a, b)

REPORTING(ZoltCopy, Word16, ZOLT_add,       add,       (Word16 a, Word16 b), a, b)
REPORTING(ZoltCopy, Word16, ZOLT_sub,       sub,       (Word16 a, Word16 b), a, b)
REPORTING(ZoltCopy, Word16, ZOLT_shr,       shr,       (Word16 x, Word16 n), x, n)
REPORTING(ZoltCopy, Word16, ZOLT_S_round,   round_BOP, (Word32 x), x)
REPORTING(ZoltCopy, Word16, ZOLT_mult_r,    mult_r,    (Word16 a, Word16 b), a, b)
REPORTING(ZoltCopy, Word16, ZOLT_mac_r,     mac_r,     (Word32 sum, Word16 a, Word16 b), sum, a, b)
REPORTING(ZoltCopy, Word16, ZOLT_msu_r,     msu_r,     (Word32 sum, Word16 a, Word16 b), sum, a, b)
REPORTING(ZoltCopy, Word32, ZOLT_L_mac,     L_mac,     (Word32 sum, Word16 a, Word16 b), sum, a, b)
REPORTING(ZoltCopy, Word32, ZOLT_L_msu,     L_msu,     (Word32 sum, Word16 a, Word16 b), sum, a, b)
REPORTING(ZoltCopy, Word32, ZOLT_L_macNs,   L_macNs,   (Word32 sum, Word16 a, Word16 b), sum, a, b)
REPORTING(ZoltCopy, Word32, ZOLT_L_msuNs,   L_msuNs,   (Word32 sum, Word16 a, Word16 b), sum, a, b)
REPORTING(ZoltCopy, Word32, ZOLT_L_sub,     L_sub,     (Word32 a, Word32 b), a, b)
REPORTING(ZoltCopy, Word32, ZOLT_L_add_c,   L_add_c,   (Word32 a, Word32 b), a, b)
REPORTING(ZoltCopy, Word32, ZOLT_L_sub_c,   L_sub_c,   (Word32 a, Word32 b), a, b)
REPORTING(ZoltCopy, Word32, ZOLT_L_sat,     L_sat,     (Word32 x), x)
REPORTING(ZoltCopy, Word32, ZOLT_L_mls,     L_mls,     (Word32 a, Word16 b), a, b)
REPORTING(ZoltCopy, Word16, ZOLT_short_sat, sature,    (Word32 x), x)
REPORTING(ZoltCopy, Word16, ZOLT_div_s,     div_s,     (Word16 a, Word16 b), a, b)
// clang-format on

// Operators whose inline form returns a struct, or is none.
EXPORTED void Log2(Word32 x, Word16 *exponent, Word16 *fraction) {
  PublishedFlags<PlainCopy> flags;
  const orvalis::Log2Result result = orvalis::Log2(*flags, x);
  *exponent = result.exponent;
  *fraction = result.fraction;
}

EXPORTED void L_Extract(Word32 x, Word16 *hi, Word16 *lo) {
  PublishedFlags<PlainCopy> flags;
  const orvalis::DoubleWord result = orvalis::L_Extract(*flags, x);
  *hi = result.hi;
  *lo = result.lo;
}

EXPORTED Word32 ZOLT_i_mult(Word16 a, Word16 b) { return a * b; }
