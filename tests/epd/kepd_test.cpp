// The end-point decision over runs of voiced and unvoiced frames, and the noise floor.
#include "Voice_Engine/epd/kepd.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <cstring>
#include <memory>
#include <sstream>
#include <string>
#include <vector>

#include "Voice_Engine/epd/epd_instance.h"
#include "tests/support/quiet_log.h"
#include "tests/support/random.h"

namespace orvalis::test {
namespace {

class KepdTest : public testing::Test {
protected:
  const QuietLog quiet;
  EpdReasons reasons{};
};

/// The decisions on frames with or without voice, both as runs like "45n 26s 1e": voiced or
/// unvoiced frames in, none, speech or end of speech out.
std::string decisions(const std::string &runs, std::uint32_t type, bool narrow_band) {
  KepdState kepd{};
  EpdReasons reasons{};
  std::istringstream in(runs);
  std::string given;
  int frames = 0;
  for (char kind = 0; in >> frames >> kind;) {
    for (; frames > 0; --frames) {
      given += "nse"[decide(kepd, kind == 'v', type, narrow_band, reasons)];
      EXPECT_EQ("nse"[reasons.answer], given.back());
    }
  }
  std::ostringstream folded;
  for (std::size_t at = 0, end = 0; at < given.size(); at = end) {
    end = std::min(given.find_first_not_of(given[at], at), given.size());
    folded << (at == 0 ? "" : " ") << end - at << given[at];
  }
  return folded.str();
}

TEST_F(KepdTest, AnswersRunsOfVoiceAndPause) {
  const struct {
    const char *runs, *wide, *narrow;
  } long_timing[] =
      {
          {"300u", "300n", "300n"},
          {"100v 40u", "44n 80s 1e 15n", "44n 83s 1e 12n"},  // initial noise frames
          {"39u 5v 1u 6v 10u", "50n 11s", "50n 11s"},
          {"45v 60u", "44n 25s 1e 35n", "44n 28s 1e 32n"},  // never too short
          {"100v 25u 10v", "44n 80s 1e 5n 5s", "44n 83s 1e 5n 2s"},
          // Four voiced frames in a row clear the pause.
          {"50v 20u 3v 5u", "44n 33s 1e", "44n 34s"},
          {"50v 20u 4v 24u 4u", "44n 54s 1e 3n", "44n 57s 1e"},
          {"50v 10u 2v 1u 2v 14u", "44n 34s 1e", "44n 35s"},
      },
    short_timing[] = {
        {"60v 20u", "42n 31s 1e 6n", "42n 34s 1e 3n"},
        {"39u 3v 1u 4v 20u", "46n 14s 7n", "46n 14s 7n"},
        // Refused at the limit of the pause, and everything is cleared.
        {"48v 20u", "42n 19s 7n", "42n 19s 7n"},
        {"49v 20u", "42n 20s 1e 6n", "42n 23s 1e 3n"},
        {"48v 20u 60v 14u", "42n 19s 10n 70s 1e", "42n 19s 10n 71s"},
    };
  for (const std::uint32_t type : {0U, 1U}) {
    for (const auto &[runs, wide, narrow] : long_timing) {
      EXPECT_EQ(decisions(runs, type, false), wide) << runs;
      EXPECT_EQ(decisions(runs, type, true), narrow) << runs;
    }
  }
  for (const std::uint32_t type : {2U, 9U, 0xFFFFFFFFU}) {
    for (const auto &[runs, wide, narrow] : short_timing) {
      EXPECT_EQ(decisions(runs, type, false), wide) << runs;
      EXPECT_EQ(decisions(runs, type, true), narrow) << runs;
    }
  }
}

TEST_F(KepdTest, CountersStopAtTheirEnd) {
  KepdState kepd{};
  kepd.in_speech = 1;
  kepd.onset_cnt = kepd.speech_frames = kepd.frame_cnt = MAX_32;
  EXPECT_EQ(decide(kepd, true, 0, false, reasons), kSpeech);
  for (const Word32 age : {kepd.onset_cnt, kepd.speech_frames, kepd.frame_cnt})
    EXPECT_EQ(age, MAX_32);
}

TEST_F(KepdTest, TellsANullRecord) {
  EpdInstance *none = nullptr;
  Flags flags;
  EXPECT_EQ(InitKEPD(&none), -1);
  EXPECT_EQ(KEPDfunc(flags, &none, nullptr, 0, reasons), -1);
}

class NoiseFloor : public KepdTest {
protected:
  NoiseFloor() {
    InitKEPD(&handle);
    InitNoiseEstimation(&handle);
  }

  /// Tracks a frame that the detector took for voice, or not.
  void track(bool voiced, const Word16 *frame) {
    record->vad.vad_flag = voiced;
    EXPECT_EQ(KEPDfunc_NoiseEstimation(&handle, frame, 0), 0);
  }

  const std::unique_ptr<EpdInstance> record = std::make_unique<EpdInstance>();
  EpdInstance *handle = record.get();
};

TEST_F(NoiseFloor, MeasuresMeanSquares) {
  auto random = seeded_generator();
  for (int round = 0; round < 1000; ++round) {
    Word16 frame[320];  // the rates see its first 160, 80 or 320 samples
    for (Word16 &x : frame)
      x = round < 5 ? MIN_16 : static_cast<Word16>(Word16(random()) >> round % 16);
    for (const auto &[rate_mode, samples] :
         {std::pair{0, 160}, {1, 80}, {-1, 80}, {3, 80}, {2, 320}}) {
      double sum = 0;
      for (int i = 0; i < samples; ++i) sum += frame[i] * frame[i];
      const double whole = std::floor(sum / samples / 100);
      ASSERT_EQ(getAbsoluteEnergy(frame, rate_mode), static_cast<float>(whole)) << rate_mode;
    }
  }
}

TEST_F(NoiseFloor, IsFinalAfterFortyFiveSpeechFrames) {
  const std::vector<Word16> loud(160, 3000);
  for (int frame = 0; frame < 45; ++frame) track(true, loud.data());
  const NoiseFloorState finished = record->noise_floor;
  for (const bool voiced : {false, true}) {
    track(voiced, loud.data());
    EXPECT_EQ(std::memcmp(&record->noise_floor, &finished, sizeof finished), 0);
  }
}

TEST_F(NoiseFloor, SwitchesTheGateOnAfterFortyFiveSpeechFrames) {
  const Word16 silence[160] = {};
  for (int frame = 1; frame <= 45; ++frame) {
    EXPECT_EQ(record->noise_floor.speech_frames_ne, frame - 1);
    track(true, silence);
  }
  EXPECT_TRUE(std::isnan(record->noise_floor.speech_noise_ratio));

  // A voice frame, by the energy that is left in a channel, that completes a block of the gate.
  VelmoraVadState &vad = record->vad;
  vad.first_frame = 0;
  vad.vad_frame_cnt = 100;
  vad.ch_enrg[0] = 4000000;
  std::ranges::fill(vad.ch_noise, 100);
  const auto threshold_after = [&](Word32 blocks) {
    vad.blk_count = blocks;
    vad.blk_frames = 24;
    Flags flags;
    EXPECT_EQ(KEPDfunc(flags, &handle, silence, 0, reasons), kNoSpeech);
    EXPECT_EQ(vad.blk_count, blocks + 1);
    return vad.energy_th;
  };
  EXPECT_EQ(threshold_after(1), 1) << "the detector got it too early";
  EXPECT_EQ(record->kepd.EnergyTHscore, 0.84F);
  EXPECT_EQ(record->noise_floor.speech_frames_ne, 46);
  EXPECT_GT(threshold_after(2), 1000);
}

}  // namespace
}  // namespace orvalis::test
