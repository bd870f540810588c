#include "Voice_Engine/epd/queries.h"

#include <algorithm>
#include <cmath>

#include "Voice_Engine/basic_op/operators.h"
#include "Voice_Engine/channel/fixed_fft_kernel.h"

namespace orvalis {

Word32 block_energy_db(const Word16 *x, Word32 n) {
  if (n < 1) return 0;
  Word32 sum = 0;
  float squares = 0;
  for (Word32 i = 0; i < n; ++i) {
    sum = wrapping_add(sum, x[i]);
    squares += static_cast<float>(x[i] * x[i]);
  }
  // At most 2^30 for any n: rounding never carries the mean beyond the maximum square.
  const auto mean_square = static_cast<Word32>(squares / static_cast<float>(n));
  const auto mean = static_cast<std::uint32_t>(sum / n);
  const Word32 variance = wrapping_sub(mean_square, static_cast<Word32>(mean * mean));
  if (variance < 1) return 0;
  return static_cast<Word32>(10 * std::log10(static_cast<double>(variance)));
}

Word32 largest_energy_db(const Word16 *x, Word32 n, Word32 rate_hz) {
  const Word32 block = energy_block_samples(rate_hz);
  if (block < 1) return 0;
  Word32 largest = 0;
  for (Word64 at = 0; at < n; at += block)
    largest = std::max(largest, block_energy_db(x + at, block));
  return largest;
}

Word32 getFrameSpectrum(Flags &flags, const Word16 *x, Word32 *out, Word32 flag) {
  const Word32 band = flag == 0 ? 0 : 1;
  const TransformPlan &plan = epd_transform_plan(band);
  const int samples = band == 0 ? 160 : 80;
  Word16 buffer[256];
  std::fill(std::copy_n(x, samples, buffer), buffer + plan.size, Word16{0});
  complex_fft(flags, buffer, Direction::kForward, plan);
  for (Word32 k = 0; k < plan.size / 2; ++k) {
    const Word16 *bin = &buffer[2 * k];
    out[k] = L_mac(flags, L_mac(flags, 0, bin[0], bin[0]), bin[1], bin[1]);
  }
  return 1;
}

}  // namespace orvalis
