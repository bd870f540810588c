#include "Voice_Engine/epd/velmora_vad.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <cstring>
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

/// A detector over a record that held `filler` bytes before it was prepared.
class Detector {
public:
  explicit Detector(Word32 band, int filler = 0x5A) : band_(band) {
    std::memset(&state, filler, sizeof state);
    VelmoraVADInit(&pointer_, band);
    state.vad_flag = 0;
    state.blk_frames = state.blk_count = 0;
    state.energy_th = state.blk_acc = state.blk_mean = state.speech_level = 0;
  }
  Word32 decide(const Word16 *frame) {
    return VelmoraVAD(flags_, &pointer_, frame, band_, reasons_);
  }
  Word32 gated(const Word16 *frame, float score) {
    return processVelmoraVAD(flags_, &pointer_, frame, &score, band_, reasons_);
  }
  int samples() const { return band_ == 0 ? 160 : 80; }

  VelmoraVadState state;

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

TEST_P(VelmoraVadBand, AgreesWithAModelThatRunsOnItsOwn) {
  Detector detector(GetParam());
  const ModelPlan &plan = GetParam() == 0 ? kWideModel : kNarrowModel;
  ModelState model = initial_model(plan);
  int frames = 0, differ = 0, voiced = 0;
  for_each_frame(speech(GetParam()), detector.samples(), [&](const Word16 *frame) {
    model.frame_cnt += 1;
    model_energies(plan, model, model_spectrum(plan, model, frame).power);
    const ModelFindings found = model_findings(plan, model);
    const bool is_noise = model_decision(plan, model, found);
    if (is_noise) model_track_noise(plan, model);
    const bool voice = !is_noise && found.total > 299999;
    frames += 1;
    voiced += voice;
    differ += voice != (detector.decide(frame) == 1);
  });
  EXPECT_LE(differ, frames / 100);
  EXPECT_GT(voiced, frames / 10);
  EXPECT_LT(voiced, frames * 9 / 10);
}

TEST_P(VelmoraVadBand, DoesNotReadWhatTheRecordHeldBefore) {
  Detector one(GetParam(), 0x00), other(GetParam(), 0xC3);
  const std::size_t channels = subject(GetParam()).model.channels();
  for_each_frame(speech(GetParam()), one.samples(), [&](const Word16 *frame) {
    ASSERT_EQ(one.gated(frame, 0.84f), other.gated(frame, 0.84f));
    ASSERT_EQ(one.state.tot_enrg, other.state.tot_enrg);
    ASSERT_EQ(one.state.hyster_cnt, other.state.hyster_cnt);
    ASSERT_TRUE(
        std::equal(one.state.ch_noise, one.state.ch_noise + channels, other.state.ch_noise));
  });
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

TEST_P(VelmoraVadBand, GateLearnsItsThresholdFromSixBlocks) {
  for (float score : {0.0f, 0.84f}) {
    Detector detector(GetParam());
    std::vector<Word64> voiced;  // energies of the voice frames so far
    Word64 level = 0, threshold = 0;
    int closed = 0;
    for_each_frame(speech(GetParam()), detector.samples(), [&](const Word16 *frame) {
      const Word32 voice = detector.gated(frame, score);
      const Word64 energy = detector.state.tot_enrg;
      if (detector.state.vad_flag == 0) {
        ASSERT_EQ(voice, 0);
        return;
      }
      voiced.push_back(energy);
      if (voiced.size() % 25 == 0 && voiced.size() >= 50 && voiced.size() <= 150) {
        const auto mean = [&](std::size_t back) {
          return std::accumulate(voiced.end() - back, voiced.end() - back + 25, Word64{0}) / 25;
        };
        level = std::max(level, (mean(50) + mean(25)) / 2);
        threshold = static_cast<Word64>(
            std::pow(10.0, std::log10(static_cast<double>(level)) * static_cast<double>(score)));
      }
      ASSERT_EQ(detector.state.speech_level, level);
      ASSERT_EQ(detector.state.energy_th, threshold);
      ASSERT_EQ(voice, threshold <= energy);
      closed += voice == 0;
    });
    EXPECT_GT(voiced.size(), 200u);
    EXPECT_EQ(detector.state.blk_count, 6);
    if (score == 0.0f) {
      EXPECT_EQ(threshold, 1);
    } else {
      EXPECT_GT(closed, 0);
    }
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

TEST(VelmoraVad, AnyOtherBandIsNarrow) {
  Detector narrow(1), negative(-1);
  for_each_frame(speech(1), 80, [&](const Word16 *frame) {
    ASSERT_EQ(narrow.decide(frame), negative.decide(frame));
    ASSERT_EQ(narrow.state.tot_enrg, negative.state.tot_enrg);
  });
}

}  // namespace
}  // namespace orvalis::test
