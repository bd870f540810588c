// The exported unscaled transforms, which check their arguments.
#include "Voice_Engine/MCRAvad/noscale_fft_512p.h"

#include <cstdio>

#include "Voice_Engine/MCRAvad/noscale_fft_kernel.h"
#include "Voice_Engine/platform/export.h"

using orvalis::Direction;

namespace {

constexpr Direction direction_of(int32_t n) {
  return n < 0 ? Direction::kInverse : Direction::kForward;
}

template <int kPoints>
int32_t transform(int32_t n, int64_t *re, int64_t *im) {
  if (!re || !im) return -1;
  orvalis::unscaled_fft<kPoints>(direction_of(n), re, im);
  return 0;
}

template <int kPoints>
int32_t spectrum(const int16_t *in, int32_t len, int32_t *re, int32_t *im, int message_line) {
  if (!in || !re || !im || len < 1 || len > kPoints) {
    std::printf("%s:%d :: input parameter error!\n", "Voice_Engine/MCRAvad/noscale_fft_512p",
                message_line);
    return -1;
  }
  orvalis::unscaled_spectrum<kPoints>(in, len, re, im);
  return 0;
}

}  // namespace

extern "C" {

ORVALIS_EXPORT int32_t FFT_dit2_noscale_512(int32_t n, int64_t *re, int64_t *im) {
  return transform<512>(n, re, im);
}

ORVALIS_EXPORT int32_t FFT_dit2_noscale_256_64bit(int32_t n, int64_t *re, int64_t *im) {
  return transform<256>(n, re, im);
}

ORVALIS_EXPORT int32_t Noscale_FFT_512p_Frame(const int16_t *in, int32_t len, int32_t *re,
                                              int32_t *im) {
  return spectrum<512>(in, len, re, im, 331);
}

ORVALIS_EXPORT int32_t Noscale_FFT_256p_Frame_64bit(const int16_t *in, int32_t len, int32_t *re,
                                                    int32_t *im) {
  return spectrum<256>(in, len, re, im, 379);
}

ORVALIS_EXPORT int32_t Noscale_FFT_256p_Frame_64bit_be(int32_t n, int32_t *re, int32_t *im) {
  orvalis::unscaled_fft_of_words<256>(direction_of(n), re, im);
  return 0;
}

ORVALIS_EXPORT void int_bitrev(int32_t n, int64_t *re, int64_t *im, const int16_t *table) {
  orvalis::reorder(n, re, im, table);
}

ORVALIS_EXPORT void int_bitrev_32bit(int32_t n, int32_t *re, int32_t *im, const int16_t *table) {
  orvalis::reorder(n, re, im, table);
}

}  // extern "C"
