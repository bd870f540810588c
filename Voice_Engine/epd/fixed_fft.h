/*
 * fixed_fft.h - the exported 16-bit fixed-point transforms of libOrvalis.so
 *
 * Radix-2 decimation-in-time complex FFTs, and real FFTs of N samples through an N/2-point complex
 * one and a split step, in place. Source: TIA IS-127 (EVRC).
 *
 *   functions                 operators   N                                    tables
 *   c_fft_epd, r_fft_epd      plain       256 (band 0) or 128 (other bands)    phs_tbl, ii_table
 *   c_fft_ns, r_fft_ns        ns_         256                                  phs_tbl_256, ...
 *
 * Buffers hold N int16_t values:
 *   complex    N/2 values, real and imaginary part interleaved
 *   real       N samples in time; in frequency element 0 is DC, element 1 is Nyquist, elements 2k
 *              and 2k + 1 are the real and imaginary part of bin k = 1..N/2 - 1
 *
 * isign 1 is forward, anything else inverse. Forward transforms halve at every stage: a bin is the
 * discrete Fourier transform divided by N/2. Inverse transforms do not scale. Sums saturate,
 * forward ones before they are halved, so complex input beyond 11585 in a part may lose accuracy.
 * The overflow flag of the operators' copy holds what the last operators left.
 *
 * Any thread may call; the buffer must hold N values, nothing is checked.
 */
#ifndef ORVALIS_FIXED_FFT_H
#define ORVALIS_FIXED_FFT_H

#include <stdint.h>

#ifdef __cplusplus
extern "C" {
#endif

void c_fft_epd(int16_t *buffer, int16_t isign, int32_t band);
void r_fft_epd(int16_t *buffer, int16_t isign, int32_t band);
void c_fft_ns(int16_t *buffer, int16_t isign);
void r_fft_ns(int16_t *buffer, int16_t isign);

/* Twiddle factors cos, -sin of 2 pi i / N for i = 0..N/2 - 1, in Q15. The first two are rounded
 * from 32768 and clipped to 32767, the third is truncated from 32767. */
extern const int16_t phs_tbl_WB[256];
extern const int16_t phs_tbl_NB[128];
extern const int16_t phs_tbl_256[256];

/* Twiddle step of every stage. */
extern const int16_t ii_table_WB[7];
extern const int16_t ii_table_NB[6];
extern const int16_t ii_table_256[7];

/* Wide band at entry 0, narrow band at entry 1. */
extern const int16_t *const phs_tbl[2];
extern const int16_t *const ii_table[2];

#ifdef __cplusplus
}
#endif

#endif /* ORVALIS_FIXED_FFT_H */
