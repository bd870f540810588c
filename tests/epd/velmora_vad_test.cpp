#include "Voice_Engine/epd/velmora_vad.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <numeric>
#include <set>

#include "tests/channel/one_step.h"
#include "tests/support/level_jumps.h"

namespace orvalis::test {
namespace {

using DetectorSubject = Subject<VelmoraVadState>;

DetectorSubject subject(Word32 band) {
  return {.plan = band == 0 ? kWideBandDetection : kNarrowBandDetection,
          .model = band == 0 ? kWideModel : kNarrowModel,
          .overlap = &VelmoraVadState::overlap,
          .frame_cnt = &VelmoraVadState::vad_frame_cnt};
}

class Detector {
public:
  explicit Detector(Word32 band) : band_(band) { VelmoraVADInit(&pointer_, band); }
  Word32 decide(const Word16 *frame) {
    return VelmoraVAD(flags_, &pointer_, frame, band_, reasons_);
  }
  Word32 gated(const Word16 *frame, float score) {
    return processVelmoraVAD(flags_, &pointer_, frame, &score, band_, reasons_);
  }
  int samples() const { return band_ == 0 ? 160 : 80; }

  VelmoraVadState state{};

private:
  Flags flags_;
  VelmoraVadState *pointer_ = &state;
  EpdReasons reasons_{};
  Word32 band_;
};

std::vector<Word16> speech(Word32 band) {
  return band == 0 ? with_level_jumps(speech_16k("numbers.raw"), 8000)
                   : with_level_jumps(speech_8k("raw/hts1.raw"), 4000);
}

template <class Decide>
void for_each_frame(const std::vector<Word16> &audio, std::size_t samples, Decide decide) {
  for (std::size_t at = 0; at + samples <= audio.size(); at += samples) decide(&audio[at]);
}

class VelmoraVadBand : public testing::TestWithParam<Word32> {};
INSTANTIATE_TEST_SUITE_P(Rates, VelmoraVadBand, testing::Values(0, 1));

TEST_P(VelmoraVadBand, FollowsTheModelFrameByFrame) {
  Detector detector(GetParam());
  Bounds bounds;
  DetectorSubject engine = subject(GetParam());
  for_each_frame(speech(GetParam()), detector.samples(), [&](const Word16 *frame) {
    const VelmoraVadState before = detector.state;
    const Word32 voice = detector.decide(frame);
    const auto step = engine.hold(bounds, before, detector.state, frame);
    const bool loud = step.found.total_energy > 299999;
    bounds.hold("flag", voice - (loud && !step.found.is_noise), 0.5);
    bounds.hold("total of the record", detector.state.tot_enrg - step.found.unclamped_energy, 0.5);
  });
  engine.expect_rare_exceptions();
}

TEST_P(VelmoraVadBand, VoiceNeedsATotalOf300000) {
  const std::vector<Word16> silence(160);
  std::set<Word64> totals;
  // In silence the energies fall to 0.45 of themselves; small steps of one channel cross the limit.
  for (Word32 step = 0; step < 1500; ++step) {
    Detector detector(GetParam());
    detector.state.first_frame = 0;
    detector.state.vad_frame_cnt = 100;
    std::ranges::fill(detector.state.overlap, Word16{0});
    std::ranges::fill(detector.state.ch_enrg, 0);
    std::ranges::fill(detector.state.ch_noise, 100);
    std::ranges::fill(detector.state.ch_enrg_long_db, Word16{0});
    detector.state.ch_enrg[0] = 665600;
    detector.state.ch_enrg[1] = step;
    const Word32 voice = detector.decide(silence.data());
    const Word64 total = std::accumulate(std::begin(detector.state.ch_enrg),
                                         std::end(detector.state.ch_enrg), Word64{0});
    ASSERT_EQ(voice, total > 299999) << total;
    totals.insert(total);
  }
  EXPECT_TRUE(totals.contains(299999) && totals.contains(300000));
}

TEST_P(VelmoraVadBand, CountsItsFramesWithoutWrapping) {
  Detector detector(GetParam());
  const std::vector<Word16> silence(160);
  detector.state.vad_frame_cnt = 32765;
  for (int expected : {32766, 32767, 32767}) {
    EXPECT_EQ(detector.decide(silence.data()), 0);
    EXPECT_EQ(detector.state.vad_frame_cnt, expected);
  }
}

TEST_P(VelmoraVadBand, GateAtItsEdges) {
  Detector detector(GetParam());
  const std::vector<Word16> audio = speech(GetParam());
  const Word16 *frame = audio.data();
  VelmoraVadState before = detector.state;
  for (; detector.decide(frame) == 0; frame += detector.samples()) before = detector.state;
  const Word64 energy = detector.state.tot_enrg;

  const auto gated_from = [&](Word32 blocks, Word64 sum, Word64 mean, Word64 threshold,
                              float score = 0.84f) {
    detector.state = before;
    detector.state.blk_count = blocks;
    detector.state.blk_frames = 24;
    detector.state.blk_acc = sum;
    detector.state.blk_mean = mean;
    detector.state.energy_th = threshold;
    return detector.gated(frame, score);
  };
  EXPECT_EQ(gated_from(6, 0, 0, energy), 1);
  EXPECT_EQ(gated_from(6, 0, 0, energy + 1), 0);
  EXPECT_EQ(detector.state.blk_frames, 24) << "nothing is learnt after six blocks";
  EXPECT_EQ(gated_from(0, 0, 0, 7), 1);
  EXPECT_EQ(detector.state.energy_th, 7) << "the first block alone moves nothing";
  EXPECT_EQ(detector.state.blk_mean, energy / 25);

  // No level at all: 10^-inf, and 10^(-inf * 0), which is not a number.
  EXPECT_EQ(gated_from(1, -energy, 0, 7), 1);
  EXPECT_EQ(detector.state.energy_th, 0);
  EXPECT_EQ(gated_from(1, -energy, 0, 7, 0.0f), 1);
  EXPECT_EQ(detector.state.energy_th, 0);

  // At a high level the single-precision score shows: 0.84f is a little less than 0.84.
  EXPECT_EQ(gated_from(1, 25000000000000 - energy, 1000000000000, 0), 0);
  EXPECT_EQ(detector.state.energy_th,
            static_cast<Word64>(std::pow(10.0, 12 * static_cast<double>(0.84f))));
  EXPECT_LT(detector.state.energy_th, static_cast<Word64>(std::pow(10.0, 12 * 0.84)));
}

}  // namespace
}  // namespace orvalis::test
