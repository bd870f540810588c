/*
 * float_fft.h - the exported single-precision transform of libOrvalis.so
 *
 * A real FFT of 512 samples through a 256-point complex one and a split step, in place; radix 2,
 * decimation in time. Source: J. W. Cooley, P. A. W. Lewis, P. D. Welch, "The fast Fourier
 * transform algorithm: programming considerations in the calculation of sine, cosine and Laplace
 * transforms", 1970.
 *
 * Packed spectrum: element 0 is bin 0 (DC), element 1 is bin 256 (Nyquist), elements 2k and 2k + 1
 * are the real and imaginary part of bin k = 1..255.
 *
 * Direction 1 is forward, any other value inverse. Forward, a bin is the discrete Fourier transform
 * divided by 256; inverse, a packed spectrum gives the samples again. Each way the root mean square
 * error is below 2e-7 of the signal's. Complex products are formed in double precision with fused
 * multiply-adds and rounded to float: the same bits on every processor.
 *
 * Any thread may call; the buffer must hold 512 floats, nothing is checked.
 */
#ifndef ORVALIS_FLOAT_FFT_H
#define ORVALIS_FLOAT_FFT_H

#include <stdint.h>

#ifdef __cplusplus
extern "C" {
#endif

/* 512 real samples and their packed spectrum. */
void r_fft(float *data, int32_t direction);

/* 256 complex values, real and imaginary part interleaved: forward divides by 256, inverse does not
 * scale. Returns data. */
float *c_fft(float *data, int32_t direction);

/* Marks the twiddle factors, which are constant, as made. The first r_fft of a process calls it. */
void fill_tbl(void);

#ifdef __cplusplus
}
#endif

#endif /* ORVALIS_FLOAT_FFT_H */
