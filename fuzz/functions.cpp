// The extended mathematics, queries and transforms: any arguments the manual allows, in buffers of
// exactly their size. What they compute is for the tests; here they only must not go astray.
#include <algorithm>
#include <cmath>

#include "Math_baseop.h"
#include "fixed_fft.h"
#include "float_fft.h"
#include "fuzz/input.h"
#include "jni/orvalis.h"
#include "noscale_fft_512p.h"

namespace {

using orvalis::fuzz::Input;
using orvalis::fuzz::require;
using orvalis::fuzz::Samples;

std::int64_t wide(Input &input) {
  const auto high = static_cast<std::uint64_t>(input.number());
  return static_cast<std::int64_t>(high << 32 | static_cast<std::uint32_t>(input.number()));
}

void compute(std::uint8_t choice, Input &input) {
  const std::int32_t x = input.number(), y = input.number();
  switch (choice % 4) {
    case 0:
      ZOLT_L_log(static_cast<std::uint32_t>(x));
      ZOLT_S_log(static_cast<std::uint32_t>(x));
      require(ZOLT_L_exp(x) == (x < 0 ? L_exp_mius(x) : L_exp_plus(x)), "e^x is one of its halves");
      ZOLT_expintFix(x);
      break;
    case 1: {
      const std::int16_t q = input.word(), out_q = input.word();
      // A shift or an exponent out of range ends the process.
      if (q > -32 && x >= 0 && std::ldexp(x, -q) < 32768)
        ZOLT_L_pow2_plus(x, q, out_q, input.byte());
      ZOLT_L_pow(x, y);
      break;
    }
    case 2:
      ZOLT_L_sin(x);
      ZOLT_L_cos(x);
      ZOLT_L_cuberoot(x);
      if (x >= 0) ZOLT_L_atan(x), ZOLT_L_root15(x);
      if (y != 0) ZOLT_L_atan2(y, x);
      break;
    default: {
      const std::int64_t a = wide(input), b = wide(input);
      require(ZOLT_L64_abs(a) >= 0, "no absolute value is negative");
      if (a >= 0) ZOLT_L64_sqrt_Q0(a);
      if (b != 0) ZOLT_L64_div(a, b);
      ZOLT_L64_mult(a, b);
      ZOLT_LL_mult_64a32(a, x);
      if (x != 0 && x != INT32_MIN && y != INT32_MIN) ZOLT_get_gcd(y, x);
      std::int64_t coefficients[9];
      for (int i = 0; i < 9; ++i) coefficients[i] = a >> i;
      ZOLT_POLYVALFix(coefficients, x, 9);
    }
  }
}

void query(std::uint8_t choice, Input &input) {
  const std::int32_t rate_hz = 100 * (input.number() % 1000);
  Samples audio = input.audio();
  const auto count = static_cast<std::int32_t>(audio.size());
  const auto exactly = [&](std::int32_t size) {
    audio.resize(static_cast<std::size_t>(size));
    return Samples(audio.begin(), audio.end());
  };
  const bool flag = (choice & 16) != 0;
  const std::int16_t sign = (choice & 32) != 0 ? -1 : 1;
  std::vector<std::int32_t> re(flag ? 512 : 256), im(re.size());
  if (choice % 4 == 0) {
    const std::int32_t energy = computeEnergy(audio.data(), count);
    require(energy >= 0 && energy <= 90, "an energy is 0 to 90 dB");
    const std::int32_t block = std::max(rate_hz / 50, 1);  // the last one is processed whole
    ComputeEnergy(exactly((count + block - 1) / block * block).data(), count, rate_hz);
  } else if (choice % 4 == 1) {
    std::vector<std::int32_t> bins(flag ? ORVALIS_BINS_16K : ORVALIS_BINS_8K, -1);
    getSpectrum(exactly(flag ? 160 : 80).data(), bins.data(), flag ? 16000 : 8000);
    for (const std::int32_t power : bins) require(power >= 0 && power <= 1 << 30, "a power");
  } else if (choice % 4 == 2) {
    r_fft_epd(exactly(flag ? 128 : 256).data(), sign, flag);
    r_fft_ns(exactly(256).data(), sign);
  } else {
    const std::int32_t length = std::clamp<std::int32_t>(count, 1, flag ? 512 : 256);
    const auto transform = flag ? Noscale_FFT_512p_Frame : Noscale_FFT_256p_Frame_64bit;
    transform(exactly(length).data(), length, re.data(), im.data());
    const Samples samples = exactly(512);
    r_fft(std::vector<float>(samples.begin(), samples.end()).data(), sign);
  }
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t *bytes, std::size_t size) {
  Input input(bytes, size);
  for (int calls = 0; !input.is_empty() && calls < 256; ++calls) {
    const std::uint8_t choice = input.byte();
    (choice & 8) == 0 ? compute(choice, input) : query(choice, input);
  }
  return 0;
}
