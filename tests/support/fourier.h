// The Fourier transform in double precision, against which every transform of the engine is held.
#pragma once

#include <complex>
#include <cstddef>
#include <numbers>
#include <vector>

namespace orvalis::test {

using Spectrum = std::vector<std::complex<double>>;

/// The sums over x[n] e^(sign 2 pi j n k / N) for N of a power of two, from those of the even and
/// of the odd values.
inline Spectrum fourier(const Spectrum &x, int sign = -1) {
  const std::size_t half = x.size() / 2;
  if (half == 0) return x;
  Spectrum even, odd, result(x.size());
  for (std::size_t i = 0; i < x.size(); ++i) (i % 2 ? odd : even).push_back(x[i]);
  even = fourier(even, sign);
  odd = fourier(odd, sign);
  for (std::size_t k = 0; k < half; ++k) {
    const double turn = std::numbers::pi * static_cast<double>(k) / static_cast<double>(half);
    const auto turned = odd[k] * std::polar(1.0, sign * turn);
    result[k] = even[k] + turned;
    result[k + half] = even[k] - turned;
  }
  return result;
}

/// Bins 0 to N / 2 - 1 of N samples, divided by N / 2; DC and Nyquist share the first.
inline Spectrum packed_bins(const std::vector<double> &samples) {
  const std::size_t half = samples.size() / 2;
  Spectrum bins = fourier({samples.begin(), samples.end()});
  bins[0] = {bins[0].real(), bins[half].real()};
  bins.resize(half);
  for (auto &bin : bins) bin /= static_cast<double>(half);
  return bins;
}

/// The samples of packed bins.
inline std::vector<double> unpacked_samples(const Spectrum &bins) {
  const std::size_t half = bins.size();
  Spectrum both(2 * half);
  both[0] = bins[0].real() / 2;
  both[half] = bins[0].imag() / 2;
  for (std::size_t k = 1; k < half; ++k) both[k] = bins[k];
  std::vector<double> samples;
  for (const auto &value : fourier(both, 1)) samples.push_back(value.real());
  return samples;
}

}  // namespace orvalis::test
