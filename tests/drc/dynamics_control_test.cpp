// Dynamics control: what it does to levels, and when.
#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>

#include "tests/support/quiet_log.h"
#include "tests/support/recordings.h"

namespace orvalis::test {
namespace {

/// Controls signals one after the other; frames are 160 samples.
struct Control {
  ~Control() { FreeMemoryDRC(handle); }
  std::int32_t process(Pcm &pcm) const {
    return ProcessDRC(handle, pcm.data(), static_cast<std::int32_t>(pcm.size()));
  }
  const QuietLog quiet;
  const std::int64_t handle = InitializeDRC(16000, 0);
};

TEST(DynamicsControl, RaisesQuietAudioByTwelveDecibelsAndFullScaleByNone) {
  for (const int peak : {500, 1000, 2000, 4000, 4300, 6000, 8192, 12000, 16384, 24000, 32767}) {
    Pcm pcm(4800, static_cast<std::int16_t>(-peak));
    Control().process(pcm);
    const double below_full_scale_db = -20 * std::log10(peak / 32768.0);
    const double gain_db = 20 * std::log10(-pcm.back() / static_cast<double>(peak));
    EXPECT_NEAR(gain_db, std::min(12.0, 2 * below_full_scale_db / 3), 0.05) << peak;
  }
}

TEST(DynamicsControl, RisesWithin12MillisecondsAndFallsWithinAFifthOfASecond) {
  const Control drc;
  const double e = std::exp(1.0);
  Pcm pcm(32000, 1000);  // most of it shows the gain
  drc.process(pcm);
  EXPECT_NEAR(std::ranges::count_if(pcm, [&](int x) { return x < 3981 * (1 - 1 / e); }), 200, 1);
  pcm.assign(pcm.size(), 1000);
  for (std::size_t i = 0; i < pcm.size(); i += 160) pcm[i] = INT16_MAX;
  EXPECT_EQ(drc.process(pcm), 0) << "loud are more than ten samples a frame";
  const auto above = std::ranges::count_if(pcm, [&](int x) { return x > 1000 + 2981 / e; });
  EXPECT_NEAR(above, 3277 + 200 - 3277 / 160, 30) << "the peaks are above, too";
}

}  // namespace
}  // namespace orvalis::test
