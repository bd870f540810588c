// The noise update decision on both sides of every threshold.
#include <gtest/gtest.h>

#include "Voice_Engine/channel/channel_plans.h"

namespace orvalis::test {
namespace {

struct Limits {
  const char *name;
  const ChannelPlan *plan;
  Word16 metric;     ///< noise up to here
  Word32 silent;     ///< undecided up to here
  Word16 deviation;  ///< voice from here on
  bool remembers_reset;

  friend void PrintTo(const Limits &limits, std::ostream *out) { *out << limits.name; }
};

constexpr Limits kLimits[] = {
    {"Wide", &kWideBandDetection, 68, 252, 2000, false},
    {"Narrow", &kNarrowBandDetection, 45, 256, 896, false},
    {"Suppressor", &kSuppression, 42, 320, 896, true},
};

/// A state made for a test.
struct Channels {
  Word32 energy[kMaxChannels] = {}, noise[kMaxChannels] = {};
  Word16 long_term_q5[kMaxChannels] = {};
  Word16 update_cnt = 30, hyster_cnt = 0, last_update_cnt = 30, unused = 0;
  Word32 frame_cnt = 1000;

  bool decide(const Limits &limits, int metric, Word32 total, int deviation) {
    Flags flags;
    ChannelState state = view();
    ChannelFindings found{};
    found.voice_metric = static_cast<Word16>(metric);
    found.total_energy = total;
    found.deviation_q5 = static_cast<Word16>(deviation);
    return decide_noise(flags, *limits.plan, state, found);
  }
  ChannelState view() {
    return {.energy = energy,
            .noise = noise,
            .long_term_q5 = long_term_q5,
            .overlap = nullptr,
            .pre_emp_mem = unused,
            .prev_shift = unused,
            .update_cnt = update_cnt,
            .hyster_cnt = hyster_cnt,
            .last_update_cnt = last_update_cnt,
            .frame_cnt = frame_cnt,
            .first_frame = false};
  }
};

class ChannelDecision : public testing::TestWithParam<Limits> {};
INSTANTIATE_TEST_SUITE_P(Plans, ChannelDecision, testing::ValuesIn(kLimits),
                         [](const auto &plan) { return plan.param.name; });

TEST_P(ChannelDecision, ThresholdsOnBothSides) {
  const Limits &limits = GetParam();
  const auto expect = [&](int metric, Word32 total, int deviation, bool noise, Word16 count) {
    Channels channels;
    EXPECT_EQ(channels.decide(limits, metric, total, deviation), noise)
        << metric << " " << total << " " << deviation;
    EXPECT_EQ(channels.update_cnt, count) << metric << " " << total << " " << deviation;
  };
  const Word16 voice = limits.metric + 1, calm = limits.deviation - 1;
  expect(limits.metric, MAX_32, MAX_16, true, 0);
  expect(voice, limits.silent, calm, false, 30);
  expect(voice, limits.silent + 1, calm, false, 31);
  expect(voice, limits.silent + 1, limits.deviation, false, 30);
}

TEST_P(ChannelDecision, FiftyCalmFramesForceAnUpdate) {
  const Limits &limits = GetParam();
  Channels channels;
  channels.update_cnt = channels.last_update_cnt = 0;
  for (int frame = 1; frame <= 60; ++frame) {
    EXPECT_EQ(channels.decide(limits, MAX_16, MAX_32, 0), frame > 49) << frame;
    EXPECT_EQ(channels.update_cnt, frame);
  }
  channels.update_cnt = MAX_16 - 1;
  for (int frame = 0; frame < 3; ++frame) {
    EXPECT_TRUE(channels.decide(limits, MAX_16, MAX_32, 0));
    EXPECT_EQ(channels.update_cnt, MAX_16);
  }
}

TEST_P(ChannelDecision, SevenUnchangedFramesForgetTheCount) {
  const Limits &limits = GetParam();
  Channels channels;
  for (int frame = 1; frame <= 7; ++frame) {
    EXPECT_EQ(channels.update_cnt, 30) << frame;
    channels.decide(limits, MAX_16, MAX_32, MAX_16);
    EXPECT_EQ(channels.hyster_cnt, frame);
  }
  EXPECT_EQ(channels.update_cnt, 0);
  EXPECT_EQ(channels.last_update_cnt, limits.remembers_reset ? 0 : 30);
  channels.decide(limits, MAX_16, MAX_32, MAX_16);
  EXPECT_EQ(channels.hyster_cnt, limits.remembers_reset ? 8 : 0);

  channels.decide(limits, MAX_16, MAX_32, 0);
  EXPECT_EQ(channels.hyster_cnt, 0) << "a counted frame starts again";
  channels.update_cnt = channels.last_update_cnt = 0;
  channels.hyster_cnt = MAX_16;
  channels.decide(limits, 0, MAX_32, 0);
  EXPECT_EQ(channels.hyster_cnt, MAX_16) << "noise may last";
}

}  // namespace
}  // namespace orvalis::test
