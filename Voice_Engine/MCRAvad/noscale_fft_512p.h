/*
 * noscale_fft_512p.h - the exported unscaled 64-bit transforms of libOrvalis.so
 *
 * Complex radix-2 FFTs of 512 and 256 points, decimation in time, in place on separate real and
 * imaginary parts. Nothing is scaled between the stages: 16-bit samples enter as x * 2^32, so that
 * 512 points cannot outgrow 64 bits and the result keeps its full precision.
 *
 * Forward is X(k) = sum of x(n) * e^(-2 pi i k n / N); inverse is the conjugate sum divided by N,
 * rounded half up. Sums beyond 64 bits wrap; 32-bit parts below 2^22 (512 points) or 2^23 (256)
 * cannot reach that. The arithmetic is exact to 2^-32, the twiddle factors only to 5e-7. So a
 * rounded bin of a frame is within 0.5 + 5.5e-7 * (sum of |x|) of the discrete Fourier transform:
 * within 1.1 for peaks at -24 dB of full scale, within 2 for loud noise, within 10 for a square
 * wave at full scale.
 *
 * n: its sign chooses the direction, negative for inverse; its magnitude should be the number of
 * points and is not used.
 *
 * Every function may be called from any thread; working arrays are on the stack. Arrays must hold N
 * values.
 */
#ifndef ORVALIS_NOSCALE_FFT_512P_H
#define ORVALIS_NOSCALE_FFT_512P_H

#include <stdint.h>

#ifdef __cplusplus
extern "C" {
#endif

/* In place; 0, or -1 if re or im is null. */
int32_t FFT_dit2_noscale_512(int32_t n, int64_t *re, int64_t *im);
int32_t FFT_dit2_noscale_256_64bit(int32_t n, int64_t *re, int64_t *im);

/* Forward transform of len real samples, with zeros behind them, to N = 512 or 256 bins, each
 * rounded half up to an integer, of which the low 32 bits are kept. Returns 0. If a pointer is null
 * or len is not in 1..N, prints a line on standard output and returns -1. */
int32_t Noscale_FFT_512p_Frame(const int16_t *in, int32_t len, int32_t *re, int32_t *im);
int32_t Noscale_FFT_256p_Frame_64bit(const int16_t *in, int32_t len, int32_t *re, int32_t *im);

/* In place on 256 complex integers, direction by the sign of n, rounded likewise. Returns 0. */
int32_t Noscale_FFT_256p_Frame_64bit_be(int32_t n, int32_t *re, int32_t *im);

/* Swaps the values i and table[i], in both arrays, wherever table[i] is above i. */
void int_bitrev(int32_t n, int64_t *re, int64_t *im, const int16_t *table);
void int_bitrev_32bit(int32_t n, int32_t *re, int32_t *im, const int16_t *table);

/* sin(2 pi i / N) in Q31, rounded to six decimals and to 24 bits; 1.0 is 2147483647. */
extern const int32_t sin_table_fft_512_noscale[512];
extern const int32_t sin_table_fft_256_noscale[256];
/* i with its 9 or 8 bits reversed. */
extern const int16_t fix_bitrev_512[512];
extern const int16_t fix_bitrev_256[256];

#ifdef __cplusplus
}
#endif

#endif /* ORVALIS_NOSCALE_FFT_512P_H */
