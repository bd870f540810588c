// The extended mathematics against its laws; queries and transforms, whose values the tests hold,
// in buffers of exactly their size. Any arguments that the manual allows.
#include <algorithm>
#include <cmath>
#include <numeric>

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

void require_near(double value, double expected, double tolerance, const char *law) {
  require(std::abs(value - expected) <= tolerance, law);
}

void compute(std::uint8_t choice, Input &input) {
  const std::int32_t x = input.number(), y = input.number();
  switch (choice % 4) {
    case 0: {
      if (x != 0) {
        const double logarithm = std::log(std::ldexp(static_cast<std::uint32_t>(x), -16));
        require_near(std::ldexp(ZOLT_L_log(x), -26), logarithm, 0.0005, "ln");
        require_near(std::ldexp(ZOLT_S_log(x), -11), logarithm, 0.001, "short ln");
      }
      const double power = std::exp(std::clamp(std::ldexp(x, -26), -21.0, 21.0));
      const double expected = std::ldexp(power, 32) * (x > -1409286144);
      for (const std::int64_t got : {ZOLT_L_exp(x), L_exp_plus(x), L_exp_mius(x)})
        require_near(static_cast<double>(got), expected, expected * 0.0002 + 1, "e^x");
      require(x == INT32_MIN || ZOLT_expintFix(x) == ZOLT_expintFix(-x), "E1 of the magnitude");
      break;
    }
    case 1: {
      const std::int16_t q = input.word(), out_q = input.word();
      // A shift or an exponent out of range ends the process.
      if (q > -32 && x >= 0 && std::ldexp(x, -q) < 32768) {
        const double power = std::exp2(std::ldexp(x, -q) + out_q);
        const std::int32_t got = ZOLT_L_pow2_plus(x, q, out_q, input.byte());
        require(power <= 0x1p31 || got == INT32_MAX, "2^x saturates");
        if (power < 0x1p30) require_near(got, power, 0.51 + power * 0.006, "2^x");
      }
      ZOLT_L_pow(x, y);
      break;
    }
    case 2: {
      const double angle = std::ldexp(x, -22), value = std::ldexp(x, -31);
      require_near(std::ldexp(ZOLT_L_sin(x), -31), std::sin(angle), 0.004, "sine");
      require_near(std::ldexp(ZOLT_L_cos(x), -31), std::cos(angle), 0.004, "cosine");
      require_near(ZOLT_L_cuberoot(x), std::ldexp(std::cbrt(value), 31), 64, "cube root");
      if (x >= 0) {
        require_near(std::ldexp(ZOLT_L_atan(x), -22), std::atan(std::ldexp(x, -11)), 0.0018,
                     "atan");
        require_near(ZOLT_L_root15(x), std::ldexp(std::pow(value, 2.0 / 3), 31), 5, "x^(2/3)");
      }
      if (y != 0)
        require_near(std::ldexp(ZOLT_L_atan2(y, x), -22), std::atan2(y, x), 0.0019, "atan2");
      break;
    }
    default: {
      const std::int64_t a = wide(input), b = wide(input);
      const auto real = static_cast<double>(a);
      require(ZOLT_L64_abs(a) >= 0, "no absolute value is negative");
      if (a >= 0)
        require_near(ZOLT_L64_sqrt_Q0(a), std::min(std::sqrt(real), 0x1p31), 1, "square root");
      if (b != 0) ZOLT_L64_div(a, b);
      ZOLT_L64_mult(a, b);
      require_near(static_cast<double>(ZOLT_LL_mult_64a32(a, x)), std::ldexp(real * x, -32),
                   1 + std::ldexp(std::abs(real * x), -82), "a * b / 2^32");
      if (x != 0 && x != INT32_MIN && y != INT32_MIN)
        require(ZOLT_get_gcd(y, x) == std::gcd(y, x), "greatest common divisor");
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
