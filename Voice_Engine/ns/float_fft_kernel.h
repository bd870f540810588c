// The kernel of the single-precision transform. For what it computes see float_fft.h.
#pragma once

#include <array>
#include <cmath>
#include <utility>

#include "Voice_Engine/basic_op/fft.h"
#include "Voice_Engine/platform/fused.h"

namespace orvalis {

inline constexpr int kTransformSamples = 512;
inline constexpr int kTransformBins = 256;  ///< bin 0 holds DC and Nyquist

/// A complex number without the special cases of std::complex's product.
template <class Real>
struct Complex {
  Real re;
  Real im;
};

/// 512 samples, or their packed spectrum, as 256 complex numbers.
using Spectrum = std::array<Complex<float>, kTransformBins>;

/// exp(-i 2 pi k / 512), as the C library computes it.
extern const std::array<Complex<double>, kTransformBins> twiddles;

/// a * b in double precision: the first product is fused with the rounded second one.
ORVALIS_KERNEL Complex<double> wide_product(Complex<double> a, Complex<double> b) {
  return {std::fma(a.re, b.re, -(a.im * b.im)), std::fma(a.re, b.im, a.im * b.re)};
}

template <class Real>
constexpr Complex<Real> conj(Complex<Real> a) {
  return {a.re, -a.im};
}

constexpr Complex<float> rounded(Complex<double> a) {
  return {static_cast<float>(a.re), static_cast<float>(a.im)};
}

constexpr Complex<double> widened(Complex<float> a) { return {a.re, a.im}; }

ORVALIS_KERNEL void complex_transform(Spectrum &data, Direction direction) {
  const bool forward = direction == Direction::kForward;
  for_each_bit_reversed_pair(
      kTransformBins, [&data](std::size_t i, std::size_t j) { std::swap(data[i], data[j]); });
  const float scale = forward ? 0.5F : 1.0F;  // at each of eight stages
  for (unsigned half = 1; half < kTransformBins; half *= 2) {
    for (unsigned j = 0; j < half; ++j) {
      const auto stored = twiddles[j * (kTransformBins / half)];
      const auto twiddle = forward ? stored : conj(stored);
      for (unsigned i = j; i < kTransformBins; i += 2 * half) {
        const auto a = data[i];
        const auto b = rounded(wide_product(widened(data[i + half]), twiddle));
        data[i] = {(a.re + b.re) * scale, (a.im + b.im) * scale};
        data[i + half] = {(a.re - b.re) * scale, (a.im - b.im) * scale};
      }
    }
  }
}

/// (z + mirror* + twiddle (z - mirror*)) / 2 of bins k and 256 - k: turns a transform of sample
/// pairs into one of samples, and back.
ORVALIS_KERNEL Complex<float> split(Complex<double> z, Complex<double> mirror,
                                    Complex<double> twiddle) {
  const auto turned = wide_product({z.re - mirror.re, z.im + mirror.im}, twiddle);
  return rounded({0.5 * (z.re + mirror.re + turned.re), 0.5 * (z.im - mirror.im + turned.im)});
}

ORVALIS_KERNEL void real_transform(Spectrum &data, Direction direction) {
  const bool forward = direction == Direction::kForward;
  if (forward) complex_transform(data, direction);
  const float scale = forward ? 1.0F : 0.5F;
  data[0] = {(data[0].re + data[0].im) * scale, (data[0].re - data[0].im) * scale};
  for (unsigned k = 1; k <= kTransformBins / 2; ++k) {
    const unsigned mirrored = kTransformBins - k;
    const auto z = widened(data[k]);
    const auto mirror = widened(data[mirrored]);
    // The odd samples' part is rotated by -i W forward, by its conjugate back.
    const auto quarter_turned = [forward](Complex<double> w) -> Complex<double> {
      return forward ? Complex<double>{w.im, -w.re} : Complex<double>{w.im, w.re};
    };
    data[k] = split(z, mirror, quarter_turned(twiddles[k]));
    data[mirrored] = split(mirror, z, quarter_turned(twiddles[mirrored]));
  }
  if (!forward) complex_transform(data, direction);
}

}  // namespace orvalis
