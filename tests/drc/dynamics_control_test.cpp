// Dynamics control: what it does to levels, and what it refuses.
#include "Voice_Engine/drc/dynamics_control.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <cstdlib>

#include "orvalis.h"
#include "tests/support/quiet_log.h"
#include "tests/support/recordings.h"
#include "tests/support/scripted_malloc.h"

namespace orvalis::test {
namespace {

constexpr int kFrame = 160;

/// A dynamics control behind the flat interface.
struct Control {
  explicit Control(int32_t rate = 16000) : handle(InitializeDRC(rate, 0)) {}
  ~Control() { EXPECT_EQ(FreeMemoryDRC(handle), 0); }
  int32_t process(Pcm &pcm) const {
    return ProcessDRC(handle, pcm.data(), static_cast<int32_t>(pcm.size()));
  }
  const QuietLog quiet;
  const int64_t handle;
};

TEST(DynamicsControl, RaisesQuietAudioByTwelveDecibelsAndFullScaleByNone) {
  for (const int peak : {500, 1000, 2000, 4000, 4300, 6000, 8192, 12000, 16384, 24000, 32767}) {
    const Control drc;
    Pcm pcm(30 * kFrame, static_cast<Word16>(-peak));
    drc.process(pcm);
    const double below_full_scale_db = -20 * std::log10(peak / 32768.0);
    const double gain_db = 20 * std::log10(-pcm.back() / static_cast<double>(peak));
    EXPECT_NEAR(gain_db, std::min(12.0, 2 * below_full_scale_db / 3), 0.05) << peak;
  }
  DrcInstance *half = initRecDynamicsControlParameter(16000, kFrame, 16384, 0);
  Pcm pcm(30 * kFrame, 1000);
  process_drc(half, pcm.data(), static_cast<Word32>(pcm.size()));
  EXPECT_NEAR(pcm.back(), 1991, 2) << "6 dB less";
  EXPECT_EQ(freeMemory_DRC(half), 0);
}

TEST(DynamicsControl, RisesWithin12MillisecondsAndFallsWithinAFifthOfASecond) {
  const Control drc;
  const double e = std::exp(1.0);
  Pcm pcm(200 * kFrame, 1000);  // most of it shows the gain
  drc.process(pcm);
  EXPECT_NEAR(std::ranges::count_if(pcm, [&](int x) { return x < 3981 * (1 - 1 / e); }), 200, 1);
  pcm.assign(pcm.size(), 1000);
  for (std::size_t i = 0; i < pcm.size(); i += kFrame) pcm[i] = MAX_16;
  drc.process(pcm);
  const auto above = std::ranges::count_if(pcm, [&](int x) { return x > 1000 + 2981 / e; });
  EXPECT_NEAR(above, 3277 + 200 - 3277 / kFrame, 30) << "the peaks are above, too";
}

TEST(DynamicsControl, CountsLoudSamplesOfTenFramesAndTheNewestTwice) {
  const struct {
    int loud_samples, loud_frames, first, last;  // frames that return 1
  } cases[] = {{10, 15, 9, 14}, {9, 20, 0, -1}, {11, 12, 8, 11}, {50, 1, 0, -1},
               {51, 1, 0, 0},   {101, 1, 0, 9}, {160, 2, 0, 10}};
  for (const auto &[loud_samples, loud_frames, first, last] : cases) {
    for (const Word16 level : {8193, -8193, 8192, -8192, -32768}) {
      const Control drc;
      for (int i = 0; i < 40; ++i) {
        Pcm frame(kFrame, 5);
        if (i < loud_frames) std::fill_n(frame.rbegin(), loud_samples, level);
        const bool loud = std::abs(level) > 8192 && first <= i && i <= last;
        ASSERT_EQ(drc.process(frame), loud) << loud_samples << ' ' << level << ' ' << i;
      }
    }
  }
  const Control drc;
  Pcm loud_first(20 * kFrame, 5);
  std::fill_n(loud_first.begin(), kFrame, MAX_16);
  EXPECT_EQ(drc.process(loud_first), 1) << "one loud frame of a call is enough";
}

TEST(DynamicsControl, LeavesAloneWhatIsNotItsOwn) {
  Pcm pcm(kFrame, 1000);
  for (const int rate : {8000, 0, 16001, -16000}) EXPECT_EQ(Control(rate).process(pcm), 0) << rate;
  const Control drc;
  for (const int count : {0, -1, INT32_MIN}) EXPECT_EQ(ProcessDRC(drc.handle, nullptr, count), 0);
  EXPECT_EQ(ProcessDRC(drc.handle, nullptr, 1), -1);
  for (const int64_t nobody : {0, -1}) {
    EXPECT_EQ(ProcessDRC(nobody, pcm.data(), 160), -1);
    EXPECT_EQ(FreeMemoryDRC(nobody), -1);
  }
  EXPECT_EQ(pcm, Pcm(kFrame, 1000));
  const auto no_memory = ScriptedMalloc::failing();
  EXPECT_EQ(InitializeDRC(16000, 1), -1);
}

}  // namespace
}  // namespace orvalis::test
