#include "tests/MCRAvad/mcra_model.h"

#include <algorithm>

#include "Voice_Engine/MCRAvad/Math_baseop.h"
#include "Voice_Engine/MCRAvad/noscale_fft_512p.h"

namespace orvalis::test {
namespace {

using std::clamp;
using std::int32_t;
using std::int64_t;

constexpr int64_t kMax = INT32_MAX;

int32_t sat(int64_t x) { return static_cast<int32_t>(clamp<int64_t>(x, INT32_MIN, INT32_MAX)); }

/// The product of Q31, half up, in halves so that it fits.
int64_t q31(int64_t x, int64_t c) {
  return (x >> 32) * c * 2 + (((x & 0xFFFFFFFF) * c + (1 << 30)) >> 31);
}

bool exceeds_64_bits(int64_t a, int64_t b) { return double(a) * double(b) >= 0x1p63; }

int64_t exp_of_minus(int32_t v) {
  return ZOLT_L_exp(v > 81920 ? -81920 << 14 : v < -81920 ? 81920 << 14 : -(v << 14));
}

int32_t ramp(int32_t zeta, int32_t low, int32_t high, int64_t offset) {
  if (zeta < low) return 0;
  if (zeta >= high) return INT32_MAX;
  const int64_t numerator = ZOLT_L_log(static_cast<std::uint32_t>(zeta)) + offset;
  return sat((numerator << 28) / 1483429151 * 64);
}

}  // namespace

void McraModel::analyse(std::vector<std::int16_t> frame, bool keeps_history) {
  before_ = now_;
  ++now_.frameIndex;
  ZOLT_S_addHamFix(160, frame.data(), ZOLT_vadHamTable1);
  int32_t re[256], im[256];
  Noscale_FFT_256p_Frame_64bit(frame.data(), 160, re, im);
  for (int k = 0; k < 128; ++k)
    now_.periodogram[k] = int64_t{re[k]} * re[k] + int64_t{im[k]} * im[k];
  noise(keeps_history);
  presence();
}

void McraModel::noise(bool keeps_history) {
  const bool first = now_.frameIndex == 0;
  if (first) std::fill_n(&now_.minHistory[0][0], 20 * 128, 0x0101010101010101);
  for (int k = 0; k < 128; ++k) {
    const int lo = std::max(k - 4, 0), hi = std::min(k + 4, 127), n = hi - lo + 1;
    int64_t scratch[9] = {};
    std::copy_n(&now_.periodogram[lo], n, scratch);
    ZOLT_L64_addHamFix(n, scratch, ZOLT_vadHamTable2 + (lo == 0 && n < 9 ? 9 - n : 0));
    int64_t &sf = now_.smoothedPeriodogram[k] = 0;
    for (int i = 0; i < n; ++i) sf += scratch[i];

    int64_t &s = now_.recursivePower[k] = q31(sf, 107374183);
    if (!first) s += q31(before_.recursivePower[k], 2040109464);

    if (first || keeps_history)
      now_.minHistory[now_.frameIndex % 20][k] = std::max<int64_t>(s, 21474);
    int64_t least = first || keeps_history ? INT64_MAX : before_.minPower[k];
    for (const auto &slot : now_.minHistory) least = std::min(least, slot[k]);
    now_.minPower[k] = least;

    const int64_t taken = s / least > 4 ? 1717986918 : 0;
    const int64_t kept = first ? 0 : q31(before_.presenceIndicatorAvg[k], 429496729);
    now_.presenceIndicatorAvg[k] = sat(kept + taken);
    now_.noiseSmoothing[k] = sat(2145336163 + q31(now_.presenceIndicatorAvg[k], 2147484));

    const int64_t alpha = before_.noiseSmoothing[k];
    now_.noisePower[k] = first ? q31(sf, 2145336163)
                               : q31(before_.noisePower[k], alpha) +
                                     q31(before_.smoothedPeriodogram[k], kMax - alpha);
  }
}

int32_t McraModel::absence(int k) const {
  const int lo = std::max(k - 20, 0), n = std::min(k + 20, 127) - lo + 1;
  int32_t scratch[41] = {};
  std::copy_n(&now_.prioriSnrAvg[lo], n, scratch);
  ZOLT_I_addHamFix(n, scratch, ZOLT_vadHamTable3);
  int64_t sum = 0;
  for (const int32_t weighted : scratch) sum += weighted;
  const int32_t local = ramp(now_.prioriSnrAvg[k], 8174, 129527, 139708119);
  const int32_t global = ramp(sat((sum + 2) >> 2), 2044, 32382, 232740758);
  const int64_t frame = now_.frameSnr >= 8174 ? kMax : 0;
  return sat(std::min<int64_t>(kMax - q31(q31(frame, local), global), 2040109466));
}

void McraModel::presence() {
  const bool first = now_.frameIndex == 0;
  int64_t low_bins = 0;
  for (int k = 0; k < 128; ++k) {
    now_.prioriSnrAvg[k] =
        first
            ? 0
            : sat(q31(before_.prioriSnrAvg[k], 1503238554) + q31(before_.prioriSnr[k], 644245094));
    if (k <= 40) low_bins += now_.prioriSnrAvg[k];
  }
  now_.frameSnr = sat((low_bins * 32 / 41 + 16) >> 5);

  for (int k = 0; k < 128; ++k) {
    const int64_t sf = now_.smoothedPeriodogram[k], lambda = now_.noisePower[k];
    const int64_t gamma = sat(lambda < 2 ? sf : ZOLT_L64_div(sf, lambda));
    const int64_t ml = gamma <= 1026 ? 1 : ((gamma - 1024) * 171798692 + (1 << 28)) >> 29;
    const int64_t a = (before_.gain[k] * int64_t{1975684956} + (1 << 29)) >> 30;
    const int64_t b = (a * before_.postSnr[k] + (1 << 13)) >> 14;
    const int64_t dd = (before_.gain[k] * b + (1 << 14)) >> 15;
    const int64_t xi = first ? ml : sat(ml + dd);

    const int64_t t = gamma * xi;
    const int64_t t8 = exceeds_64_bits(t, 8) ? INT64_MAX : t * 8;
    const int32_t v = sat((t8 / (xi + 4096) + 1) / 2);

    const int64_t half = std::min<int64_t>((ZOLT_expintFix(v) + 1) / 2, 0x1400000000);
    const int64_t e = ZOLT_L_exp(static_cast<int32_t>((half >> 6) + (first ? 0 : (half >> 5) & 1)));
    const int64_t e_xi = exceeds_64_bits(e, xi) ? INT64_MAX : e * xi;
    now_.gain[k] = sat(((e_xi >> 17) + ((e_xi >> 16) & 1)) / (xi + 4096));

    const int64_t decay = exp_of_minus(v);
    int64_t p = kMax;
    if (first) {
      const int64_t y = (20 * ((decay * q31(xi + 4096, 2040109466)) >> 6)) >> 32;
      p = (4947802324992 / (y + 128) + 1) / 2;
      if (p <= 109521666) p = 0;
    } else {
      const int64_t q = absence(k), scaled = q31(sat(xi + 4096), q);
      const bool wide = exceeds_64_bits(decay * 2, scaled);
      const int64_t x = 4 * ((wide ? INT64_MAX : decay * scaled * 2) / (kMax - q));
      if (scaled != 0 && decay != 0) p = x > kMax ? 0 : (int64_t{1} << 62) / (x + 65536) >> 15;
      if (p <= 109521665) p = 0;
    }
    now_.speechProb[k] = sat(p);
    now_.postSnr[k] = sat(gamma);
    now_.prioriSnr[k] = sat(xi);
  }
}

}  // namespace orvalis::test
