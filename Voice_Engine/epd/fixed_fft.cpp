#include "Voice_Engine/epd/fixed_fft.h"

#include "Voice_Engine/channel/fixed_fft_kernel.h"

using orvalis::Direction;
using orvalis::NsCopy;
using orvalis::PlainCopy;
using orvalis::PublishedFlags;

namespace {

constexpr Direction direction_of(int16_t isign) {
  return isign == 1 ? Direction::kForward : Direction::kInverse;
}

}  // namespace

extern "C" {

ORVALIS_EXPORT void c_fft_epd(int16_t *buffer, int16_t isign, int32_t band) {
  PublishedFlags<PlainCopy> flags;
  orvalis::complex_fft(*flags, buffer, direction_of(isign), orvalis::epd_transform_plan(band));
}

ORVALIS_EXPORT void r_fft_epd(int16_t *buffer, int16_t isign, int32_t band) {
  PublishedFlags<PlainCopy> flags;
  orvalis::real_fft(*flags, buffer, direction_of(isign), orvalis::epd_transform_plan(band));
}

ORVALIS_EXPORT void c_fft_ns(int16_t *buffer, int16_t isign) {
  PublishedFlags<NsCopy> flags;
  orvalis::complex_fft(*flags, buffer, direction_of(isign), orvalis::kSuppressionTransform);
}

ORVALIS_EXPORT void r_fft_ns(int16_t *buffer, int16_t isign) {
  PublishedFlags<NsCopy> flags;
  orvalis::real_fft(*flags, buffer, direction_of(isign), orvalis::kSuppressionTransform);
}

}  // extern "C"
