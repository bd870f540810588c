/*
 * basic_op.h - the exported fixed-point operators of libOrvalis.so
 *
 * Source: ITU-T G.191 Software Tool Library basic operators in their ITU-T G.729 form (with its
 * double-precision operators), and the fixed-point helpers of TIA IS-127 (EVRC).
 *
 * The operators exist in three copies, each with overflow and carry flags of its own:
 *
 *   copy    used by                                     flags
 *   plain   end-point detection, queries, dynamics      Overflow, Carry             (int32_t)
 *   ns_     single-channel noise suppression            ns_Overflow, ns_Carry       (int32_t)
 *   ZOLT_   extended mathematics                        Overflow_ZOLT, Carry_ZOLT   (int16_t)
 *
 * The plain and the ns_ copy differ in their flags only. The ZOLT_ copy is partial: its 16-bit
 * arithmetic, products and rounding saturate without touching a flag.
 *
 * Formats: 16-bit fractions are Q15, 32-bit fractions Q31, unless stated otherwise. Results
 * saturate. Shift counts may have any size; a negative count shifts the other way.
 *
 * Flags: 16-bit add, sub, mult, mult_r and sature set the overflow flag to 0 or 1; shifts and
 * 32-bit operators only ever set it to 1; the carry operators write both. The flags are
 * process-wide words that every engine call on every thread may change; nothing in the library
 * branches on them but the carry operators and L_sat. Frame calls and transforms leave in them what
 * their operators would leave if run one after another.
 *
 * Every function may be called from any thread. Pointers must be valid; nothing is checked.
 */
#ifndef ORVALIS_BASIC_OP_H
#define ORVALIS_BASIC_OP_H

#include <stdint.h>

#ifdef __cplusplus
extern "C" {
#endif

extern int32_t Overflow, Carry;
extern int32_t ns_Overflow, ns_Carry;
extern int16_t Overflow_ZOLT, Carry_ZOLT;

/* round(32768 * log2(1 + i/32)) for i = 0..32, clipped to 32767: the table of Log2. */
extern const int16_t tablog[33];

/* ---- 16-bit arithmetic ---------------------------------------------------------------------- */

int16_t abs_s(int16_t x); /* |x|, 32767 for -32768 */
int16_t ns_abs_s(int16_t x);
int16_t negate(int16_t x); /* -x, 32767 for -32768 */
int16_t ns_negate(int16_t x);
int16_t sature(int32_t x); /* x clipped to 16 bits */
int16_t ns_sature(int32_t x);
int16_t add(int16_t a, int16_t b);
int16_t ns_add(int16_t a, int16_t b);
int16_t sub(int16_t a, int16_t b);
int16_t ns_sub(int16_t a, int16_t b);
int16_t mult(int16_t a, int16_t b); /* (a * b) >> 15 */
int16_t ns_mult(int16_t a, int16_t b);
int16_t mult_r(int16_t a, int16_t b); /* (a * b + 2^14) >> 15 */
int16_t ns_mult_r(int16_t a, int16_t b);

/* ---- 16-bit shifts -------------------------------------------------------------------------- */

int16_t shl(int16_t x, int16_t n);
int16_t ns_shl(int16_t x, int16_t n);
int16_t shr(int16_t x, int16_t n);
int16_t ns_shr(int16_t x, int16_t n);
int16_t shr_r(int16_t x, int16_t n); /* right, rounded half up */
int16_t ns_shr_r(int16_t x, int16_t n);
int16_t shift_r(int16_t x, int16_t n); /* left for n >= 0; right, rounded half up, for n < 0 */
int16_t ns_shift_r(int16_t x, int16_t n);

/* ---- 32-bit arithmetic ---------------------------------------------------------------------- */

int16_t extract_h(int32_t x); /* bits 16..31 */
int16_t ns_extract_h(int32_t x);
int16_t extract_l(int32_t x); /* bits 0..15 */
int16_t ns_extract_l(int32_t x);
int32_t L_deposit_h(int16_t x); /* x * 2^16 */
int32_t ns_L_deposit_h(int16_t x);
int32_t L_deposit_l(int16_t x); /* x */
int32_t ns_L_deposit_l(int16_t x);
int32_t L_abs(int32_t x); /* |x|, INT32_MAX for INT32_MIN */
int32_t ns_L_abs(int32_t x);
int32_t L_negate(int32_t x); /* -x, INT32_MAX for INT32_MIN */
int32_t L_ns_negate(int32_t x);
int32_t L_add(int32_t a, int32_t b);
int32_t L_ns_add(int32_t a, int32_t b);
int32_t L_sub(int32_t a, int32_t b);
int32_t L_ns_sub(int32_t a, int32_t b);
int32_t L_mult(int16_t a, int16_t b); /* 2 * a * b */
int32_t L_ns_mult(int16_t a, int16_t b);
int32_t L_mac(int32_t sum, int16_t a, int16_t b); /* L_add(sum, L_mult(a, b)) */
int32_t ns_L_mac(int32_t sum, int16_t a, int16_t b);
int32_t L_msu(int32_t sum, int16_t a, int16_t b); /* L_sub(sum, L_mult(a, b)) */
int32_t ns_L_msu(int32_t sum, int16_t a, int16_t b);
int16_t round_BOP(int32_t x); /* high half, rounded half up */
int16_t ns_round(int32_t x);
int16_t mac_r(int32_t sum, int16_t a, int16_t b); /* L_mac, rounded */
int16_t ns_mac_r(int32_t sum, int16_t a, int16_t b);
int16_t msu_r(int32_t sum, int16_t a, int16_t b); /* L_msu, rounded */
int16_t ns_msu_r(int32_t sum, int16_t a, int16_t b);

/* ---- Arithmetic with carry: results wrap, L_sat saturates ----------------------------------- */

int32_t L_add_c(int32_t a, int32_t b); /* a + b + Carry */
int32_t L_ns_add_c(int32_t a, int32_t b);
int32_t L_sub_c(int32_t a, int32_t b); /* a - b - 1 + Carry */
int32_t L_ns_sub_c(int32_t a, int32_t b);
int32_t L_macNs(int32_t sum, int16_t a, int16_t b); /* L_add_c(sum, L_mult(a, b)) */
int32_t ns_L_macNs(int32_t sum, int16_t a, int16_t b);
int32_t L_msuNs(int32_t sum, int16_t a, int16_t b); /* L_sub_c(sum, L_mult(a, b)) */
int32_t ns_L_msuNs(int32_t sum, int16_t a, int16_t b);
int32_t L_sat(int32_t x); /* x; after an overflow the max or min, clearing both flags */
int32_t ns_L_sat(int32_t x);

/* ---- 32-bit shifts -------------------------------------------------------------------------- */

int32_t L_shl(int32_t x, int16_t n);
int32_t L_ns_shl(int32_t x, int16_t n);
int32_t L_shr(int32_t x, int16_t n);
int32_t L_ns_shr(int32_t x, int16_t n);
int32_t L_shr_r(int32_t x, int16_t n); /* right, rounded half up */
int32_t L_ns_shr_r(int32_t x, int16_t n);

/* ---- Normalisation and division ------------------------------------------------------------- */

int16_t norm_s(int16_t x); /* left shifts that normalise x: 0 for 0, 15 for -1 */
int16_t ns_norm_s(int16_t x);
int16_t norm_l(int32_t x); /* likewise for 32 bits: 0 for 0, 31 for -1 */
int16_t ns_norm_l(int32_t x);
int16_t div_s(int16_t a, int16_t b); /* Q15 a / b for 0 < a <= b, else 0 */
int16_t ns_div_s(int16_t a, int16_t b);

/* ---- Long products and division (IS-127) ---------------------------------------------------- */

int32_t L_mpy_ll(int32_t a, int32_t b); /* Q31 x Q31 -> Q31 */
int32_t ns_L_mpy_ll(int32_t a, int32_t b);
int32_t L_mpy_ls(int32_t a, int16_t b); /* Q31 x Q15 -> Q31 */
int32_t ns_L_mpy_ls(int32_t a, int16_t b);
int32_t L_divide(int32_t a, int32_t b); /* Q31 a / b for 0 <= a <= b, else 0 */
int32_t ns_L_divide(int32_t a, int32_t b);

/* ---- Complex products (IS-127): real and imaginary part apart ------------------------------- */

/* a * b with Q15 parts, result Q31. */
int32_t C2PREAL_SS(int16_t ar, int16_t ai, int16_t br, int16_t bi);
int32_t NS_C2PREAL_SS(int16_t ar, int16_t ai, int16_t br, int16_t bi);
int32_t C2PIMAG_SS(int16_t ar, int16_t ai, int16_t br, int16_t bi);
int32_t NS_C2PIMAG_SS(int16_t ar, int16_t ai, int16_t br, int16_t bi);
/* a * b with a in Q31 and b in Q15, result Q31. */
int32_t C2PREAL_LS(int32_t ar, int32_t ai, int16_t br, int16_t bi);
int32_t NS_C2PREAL_LS(int32_t ar, int32_t ai, int16_t br, int16_t bi);
int32_t C2PIMAG_LS(int32_t ar, int32_t ai, int16_t br, int16_t bi);
int32_t NS_C2PIMAG_LS(int32_t ar, int32_t ai, int16_t br, int16_t bi);
/* (a * b) * c with Q31 parts, result Q31. */
int32_t C3PREAL(int32_t ar, int32_t ai, int32_t br, int32_t bi, int32_t cr, int32_t ci);
int32_t NS_C3PREAL(int32_t ar, int32_t ai, int32_t br, int32_t bi, int32_t cr, int32_t ci);
int32_t C3PIMAG(int32_t ar, int32_t ai, int32_t br, int32_t bi, int32_t cr, int32_t ci);
int32_t NS_C3PIMAG(int32_t ar, int32_t ai, int32_t br, int32_t bi, int32_t cr, int32_t ci);

/* ---- Block scaling: in place, `length` samples ---------------------------------------------- */

/* Shifts the block, rounding, until its largest magnitude has `headroom` spare bits; returns the
 * left shift, -headroom for an all-zero block. data[0] is read whatever the length. */
int16_t block_norm_AL(int16_t *data, int16_t length, int16_t headroom);
int16_t ns_cblock_norm(int16_t *data, int16_t length, int16_t headroom);
/* The same over two blocks with one shift, truncating. */
int16_t block_norm2(int16_t *a, int16_t *b, int16_t length, int16_t headroom);
int16_t ns_cblock_norm2(int16_t *a, int16_t *b, int16_t length, int16_t headroom);
/* Shifts right by `shift` on sign and magnitude: truncates toward zero. */
void block_denorm_AL(int16_t *data, int16_t length, int16_t shift);
void ns_block_denorm(int16_t *data, int16_t length, int16_t shift);

/* ---- Logarithm, exponential, root ----------------------------------------------------------- */

/* log2(x) of the integer x > 0: whole part and Q15 fraction; 0 and 0 for x <= 0 (G.729). */
void Log2(int32_t x, int16_t *exponent, int16_t *fraction);
int32_t fnLog2(int32_t x); /* log2(x / 2^31) in Q26; INT32_MAX for 0 */
int32_t ns_fnLog2(int32_t x);
int32_t fnLog10(int32_t x); /* log10(x / 2^31) in Q26; INT32_MAX for 0 */
int32_t ns_fnLog10(int32_t x);
int32_t fnExp2(int32_t x); /* 2^x in Q31 for x < 0 in Q26; one half for 0 */
int32_t ns_fnExp2(int32_t x);
int32_t fnExp10(int32_t x); /* 10^x in Q31 for x < 0 in Q26; one half for 0 */
int32_t ns_fnExp10(int32_t x);
int16_t sqroot(int32_t x); /* Q15 root of a normalised Q31 value (0.5 <= x < 1) */
int16_t ns_sqroot(int32_t x);

/* ---- Double-precision format: value = hi * 2^16 + lo * 2, lo in 0..32767 (G.729) ------------ */

int32_t L_Comp(int16_t hi, int16_t lo);
int32_t ns_L_Comp(int16_t hi, int16_t lo);
void L_Extract(int32_t x, int16_t *hi, int16_t *lo);
int32_t Mpy_32(int16_t a_hi, int16_t a_lo, int16_t b_hi, int16_t b_lo);
int32_t Mpy_32_16(int16_t a_hi, int16_t a_lo, int16_t b);
/* Q31 a / b for 0 <= a < b, b normalised (b_hi >= 0x4000). */
int32_t Div_32(int32_t a, int16_t b_hi, int16_t b_lo);

/* ---- The ZOLT_ copy -------------------------------------------------------------------------
 * As the members above, but add, sub, mult_r, S_round, L_mac and mac_r touch no flag, and the
 * product inside the others saturates silently. */

int16_t ZOLT_add(int16_t a, int16_t b);
int16_t ZOLT_sub(int16_t a, int16_t b);
int16_t ZOLT_abs_s(int16_t x);
int16_t ZOLT_negate(int16_t x);
int16_t ZOLT_shr(int16_t x, int16_t n); /* n = -15..-1 wraps, n <= -16 saturates */
int16_t ZOLT_extract_h(int32_t x);
int16_t ZOLT_extract_l(int32_t x);
int16_t ZOLT_S_round(int32_t x); /* as round_BOP */
int16_t ZOLT_mult_r(int16_t a, int16_t b);
int16_t ZOLT_mac_r(int32_t sum, int16_t a, int16_t b);
int16_t ZOLT_msu_r(int32_t sum, int16_t a, int16_t b);
int32_t ZOLT_L_mac(int32_t sum, int16_t a, int16_t b);
int32_t ZOLT_L_msu(int32_t sum, int16_t a, int16_t b);
int32_t ZOLT_L_macNs(int32_t sum, int16_t a, int16_t b);
int32_t ZOLT_L_msuNs(int32_t sum, int16_t a, int16_t b);
int32_t ZOLT_L_sub(int32_t a, int32_t b);
int32_t ZOLT_L_add_c(int32_t a, int32_t b);
int32_t ZOLT_L_sub_c(int32_t a, int32_t b);
int32_t ZOLT_L_sat(int32_t x);
int32_t ZOLT_L_negate(int32_t x);
int32_t ZOLT_L_abs(int32_t x);
int32_t ZOLT_L_deposit_h(int16_t x);
int32_t ZOLT_L_deposit_l(int16_t x);
int32_t ZOLT_L_mls(int32_t a, int16_t b); /* Q31 x Q15 -> Q31, low half unsigned */
int16_t ZOLT_norm_s(int16_t x);
int16_t ZOLT_norm_l(int32_t x);
int16_t ZOLT_expadj_s(int16_t x, int16_t max_shift); /* min(max_shift, norm_s(x)); 0 counts 15 */
int16_t ZOLT_short_sat(int32_t x);                   /* as sature, with Overflow_ZOLT */
int32_t ZOLT_i_mult(int16_t a, int16_t b);           /* a * b */
/* Divisions. Operands out of range print a line on standard output and END THE PROCESS with exit
 * status 0: check them first. */
int16_t ZOLT_div_s(int16_t a, int16_t b); /* Q15 a / b for 0 <= a <= b, b > 0 */
int16_t ZOLT_div_l(int32_t a, int16_t b); /* Q15 a / (b * 2^16) for a >= 0, b > 0 */

#ifdef __cplusplus
}
#endif

#endif /* ORVALIS_BASIC_OP_H */
