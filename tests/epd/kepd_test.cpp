// The end-point decision on scripted voice, and the noise floor.
#include "Voice_Engine/epd/kepd.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <cmath>
#include <cstring>
#include <memory>
#include <numeric>
#include <vector>

#include "Voice_Engine/epd/epd_instance.h"
#include "tests/support/log_capture.h"
#include "tests/support/random.h"
#include "tests/support/scripted_voice.h"

namespace orvalis::test {
namespace {

const LogLine kOnsetLine = info_line("TQE: Onset of voice ... VAD_communication_flag ");

/// KEPD over a record of its own.
class Kepd {
public:
  explicit Kepd(Word32 rate_mode = 0) {
    record->rateMode = rate_mode;
    InitKEPD(&handle_);
    InitNoiseEstimation(&handle_);
  }

  Word32 answer(bool voiced, std::uint32_t type) {
    voice.says(voiced);
    return judge(type);
  }

  /// Judges a frame with the voice decision as it stands.
  Word32 judge(std::uint32_t type = 0) {
    static constexpr Word16 kFrame[160] = {};
    Flags flags;
    return KEPDfunc(flags, &handle_, kFrame, type);
  }

  void track_noise(const Word16 *frame) { KEPDfunc_NoiseEstimation(&handle_, frame, 0); }
  void reset() { EXPECT_EQ(KEPDfunc_Reset(&handle_), 0); }

  ScriptedVoice voice;
  std::unique_ptr<EpdInstance> record = std::make_unique<EpdInstance>();

private:
  EpdInstance *handle_ = record.get();
};

class KepdTest : public testing::Test {
protected:
  LogCapture log;
};

/// The decision once more, written as the list of its steps.
struct Automaton {
  enum { kOnset, kPause, kInSpeech, kLong, kEnd, kRun, kSpeech, kFrame };
  std::array<Word32, 8> state{};
  int onsets = 0;
  int refusals = 0;
  int resets = 0;

  void reset() {
    ++resets;
    close(0);
    state[kRun] = 0;
  }

  Word32 close(Word32 answer) {
    for (const int field : {kOnset, kPause, kInSpeech, kLong, kEnd, kSpeech}) state[field] = 0;
    return answer;
  }

  Word32 judge(int r, std::uint32_t type, Word32 rate_mode) {
    const int onset = type < 2 ? 6 : 4;
    const int pause_limit = type < 2 ? 25 : 14;
    const int end_delay = rate_mode == 0 ? 1 : 4;
    if (++state[kFrame] <= 39) r = 0;
    if (r == 0) {
      state[kOnset] = 0;
    } else if (++state[kOnset] >= onset) {
      state[kInSpeech] = 1;
      if (state[kOnset] == onset) ++onsets;
      goto voiced;
    }
    if (state[kInSpeech] == 1 && r == 1) goto voiced;
    if (state[kInSpeech] == 1) state[kPause] += 1;
    state[kRun] = 0;
    goto pause;
  voiced:
    state[kRun] += 1;
    if (state[kRun] > 3) {
      state[kPause] = 0;
      state[kRun] = 0;
      goto count;
    }
  pause:
    if (state[kPause] >= pause_limit) {
      if (state[kSpeech] <= 19) {
        ++refusals;
        return close(0);
      }
      state[kLong] = 1;
    }
  count:
    if (state[kInSpeech] != 1) return 0;
    state[kSpeech] += 1;
    if (state[kLong] == 1) state[kEnd] += 1;
    return state[kEnd] < end_delay ? 1 : close(2);
  }
};

TEST_F(KepdTest, FollowsTheAutomaton) {
  auto random = seeded_generator();
  const auto up_to = [&](int limit) { return static_cast<int>(random() % limit); };
  constexpr std::uint32_t kTypes[] = {0, 1, 2, 3, 0xFFFFFFFF};
  int ends = 0;
  int refusals = 0;
  for (int sequence = 0; sequence < 3000; ++sequence) {
    const Word32 rate_mode = std::array{0, 1, -1}[up_to(3)];
    Kepd kepd(rate_mode);
    Automaton model;
    std::uint32_t type = kTypes[up_to(5)];
    const bool type_changes = up_to(4) == 0;
    const int longest_run[] = {2 + up_to(40), 2 + up_to(20)};
    int run = 0;
    bool voiced = false;
    for (int frame = 0; frame < 400; ++frame) {
      if (run-- == 0) {
        voiced = !voiced;
        run = up_to(longest_run[voiced]);
        if (type_changes) type = kTypes[up_to(5)];
      }
      const Word32 answer = model.judge(voiced, type, rate_mode);
      ASSERT_EQ(kepd.answer(voiced, type), answer) << "sequence " << sequence << ", " << frame;
      ends += answer == 2;
      if (up_to(300) == 0) {
        kepd.reset();
        model.reset();
      }
      const KepdState &s = kepd.record->kepd;
      const std::array state{s.onset_cnt, s.pause_cnt,  s.in_speech,     s.long_speech,
                             s.end_cnt,   s.voiced_run, s.speech_frames, s.frame_cnt};
      ASSERT_EQ(state, model.state) << "sequence " << sequence << ", " << frame;
    }
    const LogLines lines = log.take();
    ASSERT_EQ(std::count(lines.begin(), lines.end(), kOnsetLine), model.onsets);
    ASSERT_EQ(std::ssize(lines), model.onsets + model.resets);
    refusals += model.refusals;
  }
  EXPECT_GT(ends, 1000);
  EXPECT_GT(refusals, 1000);
}

TEST_F(KepdTest, TellsANullRecord) {
  EpdInstance *none = nullptr;
  Flags flags;
  EXPECT_EQ(InitKEPD(&none), -1);
  EXPECT_EQ(KEPDfunc(flags, &none, nullptr, 0), -1);
}

using NoiseFloor = KepdTest;

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

TEST_F(NoiseFloor, KeepsHistoryAndFeedsTheFloorBack) {
  auto random = seeded_generator();
  Kepd kepd;
  const NoiseFloorState &floor = kepd.record->noise_floor;
  std::vector<double> history(45, 0.0);
  double noise = 0;
  double speech = 0;
  int noise_frames = 0;
  int speech_frames = 0;
  while (noise_frames < 200 || speech_frames < 45) {
    // The last speech frame ends the tracking, so it waits for the noise.
    const bool voiced = random() % 4 == 0 && (speech_frames < 44 || noise_frames >= 200);
    const auto level = static_cast<Word16>(10 * (random() % 200));
    const double energy = level * level / 100;
    std::vector<Word16> frame(160, level);
    kepd.record->vad.vad_flag = voiced;
    kepd.track_noise(frame.data());
    if (voiced) {
      ++speech_frames;
      speech += energy;
    } else {
      ++noise_frames;
      if (noise_frames > 45) history.erase(history.begin());
      history.resize(45);
      history[std::min(noise_frames, 45) - 1] = energy;
      noise = std::accumulate(history.begin(), history.end(), noise) / std::min(noise_frames, 45);
    }
    ASSERT_EQ(floor.noise_frames, noise_frames);
    ASSERT_EQ(floor.speech_frames_ne, speech_frames);
    ASSERT_TRUE(std::equal(history.begin(), history.end(), floor.energy_hist)) << noise_frames;
    ASSERT_NEAR(floor.noise_energy, noise, 1e-5 * noise) << noise_frames;
    ASSERT_NEAR(floor.speech_energy, speech_frames < 45 ? speech : speech / 45, 1e-5 * speech);
  }
  EXPECT_NEAR(floor.speech_noise_ratio, speech / 45 / noise, 1e-5 * speech / noise);

  const NoiseFloorState finished = floor;
  const std::vector<Word16> loud(160, 30000);
  for (const Word32 voiced : {0, 1}) {
    kepd.record->vad.vad_flag = voiced;
    kepd.track_noise(loud.data());
    EXPECT_EQ(std::memcmp(&floor, &finished, sizeof finished), 0);
  }
}

TEST_F(NoiseFloor, SwitchesTheGateOnAfterFortyFiveSpeechFrames) {
  Kepd kepd;
  kepd.voice.flag = 1;
  kepd.voice.answer = 0;  // voice that the gate refuses is speech to the noise floor
  const Word16 silence[160] = {};
  for (int frame = 1; frame <= 45; ++frame) {
    kepd.judge();
    kepd.track_noise(silence);
  }
  EXPECT_TRUE(std::isnan(kepd.record->noise_floor.speech_noise_ratio));
  EXPECT_EQ(kepd.record->kepd.EnergyTHscore, 0.0F);
  EXPECT_EQ(log.take(), LogLines{});

  kepd.judge();
  EXPECT_EQ(kepd.voice.heard_score, 0.0F) << "the detector heard of it too early";
  EXPECT_EQ(kepd.record->kepd.EnergyTHscore, 0.84F);
  EXPECT_EQ(kepd.record->noise_floor.speech_frames_ne, 46);
  EXPECT_EQ(log.take(), LogLines{info_line("TQE: EnergyTHscore: 0.840000")});

  kepd.reset();
  EXPECT_EQ(log.take(), LogLines{info_line("TQE: reset KEPDfunc params")});
  kepd.judge();
  EXPECT_EQ(kepd.voice.heard_score, 0.84F);
  EXPECT_EQ(kepd.record->kepd.frame_cnt, 47);
  EXPECT_EQ(log.take(), LogLines{});
}

}  // namespace
}  // namespace orvalis::test
