// Queries and transforms: any audio, in buffers of exactly their size, against what they stand for.
#include <algorithm>
#include <cmath>
#include <complex>
#include <numbers>

#include "fixed_fft.h"
#include "float_fft.h"
#include "fuzz/input.h"
#include "jni/orvalis.h"
#include "noscale_fft_512p.h"

namespace {

using orvalis::fuzz::Input;
using orvalis::fuzz::require;
using Samples = std::vector<std::int16_t>;
using Bins = std::vector<std::complex<double>>;

/// `audio` as exactly `size` samples, so that reading beyond them is noticed.
Samples exactly(const Samples &audio, std::size_t size) {
  Samples samples(audio.begin(), audio.begin() + static_cast<long>(std::min(size, audio.size())));
  samples.resize(size);
  return {samples.begin(), samples.end()};
}

/// Bins 0 to N / 2 of N samples.
Bins spectrum_of(const Samples &samples) {
  const std::size_t size = samples.size();
  Bins roots(size), bins(size / 2 + 1);
  for (std::size_t i = 0; i < size; ++i)
    roots[i] =
        std::polar(1.0, -2 * std::numbers::pi * static_cast<double>(i) / static_cast<double>(size));
  for (std::size_t k = 0; k < bins.size(); ++k)
    for (std::size_t i = 0; i < size; ++i)
      bins[k] += roots[k * i % size] * static_cast<double>(samples[i]);
  return bins;
}

/// Holds a packed spectrum against the bins, which it gives divided by N / 2.
template <class Value>
void require_bins(const std::vector<Value> &packed, const Bins &bins, double tolerance) {
  const auto half = static_cast<double>(packed.size()) / 2;
  for (std::size_t k = 1; k < packed.size() / 2; ++k)
    require(std::abs(std::complex<double>(packed[2 * k], packed[2 * k + 1]) - bins[k] / half) <=
                tolerance,
            "a bin is the discrete Fourier transform");
  require(std::abs(packed[0] - bins[0].real() / half) <= tolerance, "DC");
  require(std::abs(packed[1] - bins.back().real() / half) <= tolerance, "Nyquist");
}

void check_energy(const Samples &audio, std::int32_t rate_hz) {
  const auto count = static_cast<std::int32_t>(audio.size());
  const std::int32_t energy = computeEnergy(audio.data(), count);
  require(energy >= 0 && energy <= 90, "an energy is 0 to 90 dB");
  const std::int32_t block = rate_hz / 50;
  if (block < 1) {
    require(ComputeEnergy(audio.data(), count, rate_hz) == 0, "no block, no energy");
  } else if (block < 4096) {
    const std::size_t whole =
        audio.size() / static_cast<std::size_t>(block) * static_cast<std::size_t>(block);
    const Samples blocks = exactly(audio, whole);
    std::int32_t loudest = 0;
    for (std::size_t at = 0; at < whole; at += static_cast<std::size_t>(block))
      loudest = std::max(loudest, computeEnergy(&blocks[at], block));
    require(ComputeEnergy(blocks.data(), static_cast<std::int32_t>(whole), rate_hz) == loudest,
            "the energy is that of the loudest block");
  }
}

void check_spectrum(const Samples &audio, bool is_wide) {
  const Samples frame = exactly(audio, is_wide ? ORVALIS_FRAME_16K : ORVALIS_FRAME_8K);
  std::vector<std::int32_t> spectrum(is_wide ? ORVALIS_BINS_16K : ORVALIS_BINS_8K, -1);
  require(getSpectrum(frame.data(), spectrum.data(), is_wide ? 16000 : 8000) == 1, "it answers");
  for (const std::int32_t power : spectrum)
    require(power >= 0 && power <= 1 << 30, "a power is 0 to 2^30");
}

void check_fixed(const Samples &audio, bool is_narrow, bool is_inverse) {
  Samples frame = exactly(audio, is_narrow ? 128 : 256);
  // Louder audio may saturate between the stages.
  for (std::int16_t &sample : frame) sample = static_cast<std::int16_t>(sample * 11585 / 32768);
  const Bins bins = spectrum_of(frame);
  Samples other = frame;
  r_fft_epd(frame.data(), is_inverse ? -1 : 1, is_narrow);
  if (!is_inverse) require_bins(frame, bins, 8);
  if (is_narrow) return;
  r_fft_ns(other.data(), is_inverse ? -1 : 1);
  if (!is_inverse) require_bins(other, bins, 8);
}

void check_float(const Samples &audio) {
  const Samples samples = exactly(audio, 512);
  std::vector<float> data(samples.begin(), samples.end());
  r_fft(data.data(), 1);
  require_bins(data, spectrum_of(samples), 0.05);
  r_fft(data.data(), -1);
  for (std::size_t i = 0; i < data.size(); ++i)
    require(std::abs(data[i] - static_cast<float>(samples[i])) < 0.05F, "the inverse undoes it");
}

void check_unscaled(const Samples &audio, bool is_long) {
  const std::size_t size = is_long ? 512 : 256;
  const Samples frame = exactly(audio, std::clamp<std::size_t>(audio.size(), 1, size));
  std::vector<std::int32_t> re(size), im(size);
  const auto count = static_cast<std::int32_t>(frame.size());
  const std::int32_t result =
      is_long ? Noscale_FFT_512p_Frame(frame.data(), count, re.data(), im.data())
              : Noscale_FFT_256p_Frame_64bit(frame.data(), count, re.data(), im.data());
  require(result == 0, "it answers");
  const Bins bins = spectrum_of(exactly(frame, size));
  double tolerance = 0.75;  // both parts are rounded
  for (const std::int16_t sample : frame) tolerance += 5.5e-7 * std::abs(sample);
  for (std::size_t k = 0; k < bins.size(); ++k)
    require(std::abs(std::complex<double>(re[k], im[k]) - bins[k]) <= tolerance,
            "a bin is the discrete Fourier transform");
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t *bytes, std::size_t size) {
  Input input(bytes, size);
  for (int calls = 0; !input.is_empty() && calls < 32; ++calls) {
    const std::uint8_t choice = input.byte();
    const std::int32_t rate_hz = static_cast<std::int32_t>(100 * (input.number() % 1000));
    const Samples audio = input.audio();
    const bool flag = (choice & 8) != 0;
    switch (choice % 5) {
      case 0:
        check_energy(audio, rate_hz);
        break;
      case 1:
        check_spectrum(audio, flag);
        break;
      case 2:
        check_fixed(audio, flag, (choice & 16) != 0);
        break;
      case 3:
        check_float(audio);
        break;
      default:
        check_unscaled(audio, flag);
    }
  }
  return 0;
}
