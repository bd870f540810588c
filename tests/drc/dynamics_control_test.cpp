// Dynamics control: its steps a second time on the exported operators, bit by bit, and their effect
// on levels.
#include "Voice_Engine/drc/dynamics_control.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <cmath>
#include <cstdlib>
#include <filesystem>
#include <string>

#include "orvalis.h"
#include "tests/support/flag_words.h"
#include "tests/support/level_jumps.h"
#include "tests/support/log_capture.h"
#include "tests/support/noise.h"
#include "tests/support/random.h"
#include "tests/support/scripted_malloc.h"
#include "tests/support/temporary_folder.h"

namespace orvalis::test {
namespace {

namespace fs = std::filesystem;

constexpr int kFrame = 160;
constexpr FlagWords kUntouched = {7, 7, 7, 7, 7, 7};  // no operator writes a 7

/// A dynamics control behind the flat interface.
struct Control {
  explicit Control(int32_t rate = 16000, int32_t dumps = 0) : handle(InitializeDRC(rate, dumps)) {}
  ~Control() { EXPECT_EQ(FreeMemoryDRC(handle), 0); }
  int32_t process(Pcm &pcm) const {
    return ProcessDRC(handle, pcm.data(), static_cast<int32_t>(pcm.size()));
  }
  const int64_t handle;
};

/// Q11 gain by the peak in 63rds of full scale: 12 dB, and 3:1 compression where that is less.
Word16 curve(int index) {
  const double gain = std::min(std::pow(10, 0.6), std::pow(63.0 / index, 2.0 / 3));
  return static_cast<Word16>(std::lrint(2048 * gain));
}

struct Model {
  bool frame_is_loud(Word16 *frame) {
    Word16 peak = 0, loud = 0, hi = 0, lo = 0;
    for (int i = 0; i < kFrame; ++i) {
      const Word16 magnitude = abs_s(frame[i]);
      peak = std::max(peak, magnitude);
      loud = static_cast<Word16>(loud + (magnitude > 8192));
    }
    newest = (newest + 1) % 10;
    loud_of_frame[newest] = loud;
    L_Extract(L_mult(peak, 63), &hi, &lo);
    const Word16 rest = sub(32767, lo);
    const Word32 target = L_mac(L_mult(lo, curve(hi + 1)), rest, curve(hi));
    for (int i = 0; i < kFrame; ++i) {
      const Word32 difference = L_sub(target, envelope);
      L_Extract(difference, &hi, &lo);
      envelope = L_add(envelope, Mpy_32_16(hi, lo, difference < 1 ? 10 : 164));
      const Word16 gain = mult_r(scale, extract_h(envelope));
      frame[i] = round_BOP(L_shl(L_mult(frame[i], gain), 4));
    }
    int sum = loud;
    for (const Word16 count : loud_of_frame) sum += count;
    return sum > 100;
  }

  Word16 scale = 32767;
  Word32 envelope = 0;
  int newest = 0;
  std::array<Word16, 10> loud_of_frame{};
};

class DynamicsControl : public testing::Test {
protected:
  ~DynamicsControl() override { SetDumpRoot(nullptr); }

  LogCapture log;
  const TemporaryFolder root;
};

TEST_F(DynamicsControl, FollowsItsStepsOverTheOperators) {
  auto random = seeded_generator();
  Pcm audio = with_level_jumps(speech_16k("numbers.raw"), 8000);
  for (int i = 0; i < 60 * kFrame; ++i) audio.push_back(static_cast<Word16>(random()));
  for (int i = 0; i < 60 * kFrame; ++i) audio.push_back(i / 40 % 2 ? MAX_16 : MIN_16);
  audio.insert(audio.end(), 60 * kFrame, 0);
  audio.insert(audio.end(), 60 * kFrame, MIN_16);  // loud at once, with the gain of silence
  SetDumpRoot(root.path().c_str());
  fs::create_directory(root.path() / "sdcard");

  const Control drc(16000, 1);
  Model model;
  Pcm before, after;
  std::array<int, 2> results{};
  log.take();
  for (std::size_t at = 0; at + 4 * kFrame <= audio.size();) {
    const int count = 1 + static_cast<int>(random() % (3 * kFrame));
    const int touched = (count + kFrame - 1) / kFrame * kFrame;  // a partial frame counts as whole
    Pcm pcm(&audio[at], &audio[at] + 4 * kFrame), expected = pcm;
    at += touched;
    before.insert(before.end(), pcm.begin(), pcm.begin() + touched);
    write_flags(kUntouched);
    bool loud = false;
    for (int start = 0; start < touched; start += kFrame)
      loud |= model.frame_is_loud(&expected[start]);
    const FlagWords flags = read_flags();
    after.insert(after.end(), expected.begin(), expected.begin() + touched);

    write_flags(kUntouched);
    ASSERT_EQ(ProcessDRC(drc.handle, pcm.data(), count), loud) << at;
    ASSERT_EQ(read_flags(), flags) << at;
    ASSERT_EQ(pcm, expected) << at;
    ++results[loud];
  }
  EXPECT_GT(results[0], 100);
  EXPECT_GT(results[1], 100);
  EXPECT_EQ(log.take(), LogLines{debug_line("TQE: with doDRC ... samplingRate = 16000")});
  const std::string stem = root / ("sdcard/" + std::to_string(drc.handle));
  EXPECT_EQ(load_recording(stem + "_beforeDRC.pcm"), before);
  EXPECT_EQ(load_recording(stem + "_afterDRC.pcm"), after);
}

TEST_F(DynamicsControl, RaisesQuietAudioByTwelveDecibelsAndFullScaleByNone) {
  for (const int peak : {500, 1000, 2000, 4000, 4300, 6000, 8192, 12000, 16384, 24000, 32767}) {
    const Control drc;
    Pcm pcm(30 * kFrame, static_cast<Word16>(-peak));
    drc.process(pcm);
    const double below_full_scale_db = -20 * std::log10(peak / 32768.0);
    const double gain_db = 20 * std::log10(-pcm.back() / static_cast<double>(peak));
    EXPECT_NEAR(gain_db, std::min(12.0, 2 * below_full_scale_db / 3), 0.05) << peak;
  }
}

TEST_F(DynamicsControl, RisesWithin12MillisecondsAndFallsWithinAFifthOfASecond) {
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

TEST_F(DynamicsControl, RaisesQuietPassagesOfSpeechByTheCurve) {
  Pcm pcm = with_level_jumps(speech_16k("numbers.raw"), 8000);
  pcm.resize(pcm.size() / kFrame * kFrame);
  const auto before = frame_levels(pcm, kFrame);
  std::vector<bool> quiet(before.size());
  int loud_frames = 0;
  int calm = 10;  // frames since the last that peaked above an eighth of full scale
  for (std::size_t i = 0; i < quiet.size(); ++i) {
    const auto [low, high] = std::minmax_element(&pcm[i * kFrame], &pcm[i * kFrame] + kFrame);
    const int peak = std::max(-*low, +*high);
    loud_frames += peak > 8192;
    calm = peak < 4096 ? calm + 1 : 0;
    quiet[i] = i > 10 && calm > 10 && before[i] > 30;
  }
  const Control drc;
  drc.process(pcm);
  const auto after = frame_levels(pcm, kFrame);
  for (std::size_t i = 0; i < quiet.size(); ++i) {
    if (!quiet[i]) continue;
    EXPECT_NEAR(after[i] - before[i], 12, 0.05) << i;
  }
  EXPECT_GT(loud_frames, 100);
  EXPECT_GT(std::ranges::count(quiet, true), 100);
}

TEST_F(DynamicsControl, CountsLoudSamplesOfTenFramesAndTheNewestTwice) {
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

  Word16 loud = 3;
  const Word16 samples[] = {-8192, 8192, -8193, 8193, -32768, 0};
  EXPECT_EQ(DetectPeakVal(samples, 4, &loud), 8193);
  EXPECT_EQ(loud, 5);
  EXPECT_EQ(DetectPeakVal(samples, 6, &loud), 32767);
  EXPECT_EQ(loud, 8);
  for (const Word16 none : {0, -1}) EXPECT_EQ(DetectPeakVal(samples, none, &loud), 0);
  EXPECT_EQ(loud, 8);
}

TEST_F(DynamicsControl, LeavesAloneWhatIsNotItsOwn) {
  const Pcm original = speech_16k("numbers.raw");
  Pcm pcm = original;
  write_flags(kUntouched);
  for (const int rate : {8000, 0, 16001, -16000}) {
    const Control drc(rate, 1);
    const std::string created = "Create DRC, SamplingRate : " + std::to_string(rate);
    EXPECT_EQ(log.take(),
              (LogLines{debug_line(created + ", PCM_LEN : 80"), debug_line("Create DRC end")}));
    EXPECT_EQ(drc.process(pcm), 0) << rate;
  }
  const Control drc;
  log.take();
  for (const int count : {0, -1, INT32_MIN}) EXPECT_EQ(ProcessDRC(drc.handle, nullptr, count), 0);
  EXPECT_EQ(ProcessDRC(drc.handle, nullptr, 1), -1);
  for (const int64_t nobody : {0, -1}) {
    EXPECT_EQ(ProcessDRC(nobody, pcm.data(), 160), -1);
    EXPECT_EQ(FreeMemoryDRC(nobody), -1);
  }
  EXPECT_EQ(log.take(), LogLines{});
  EXPECT_EQ(pcm, original);
  EXPECT_EQ(read_flags(), kUntouched);

  const auto no_memory = ScriptedMalloc::failing();
  EXPECT_EQ(InitializeDRC(16000, 1), -1);
  EXPECT_EQ(log.take(), LogLines{debug_line("Create DRC, SamplingRate : 16000, PCM_LEN : 160")});
}

TEST_F(DynamicsControl, OpensNoFileItShouldNotAndLeavesNoneOpen) {
  const auto open_files = [] { return std::distance(fs::directory_iterator("/proc/self/fd"), {}); };
  const auto before = open_files();
  Pcm pcm(4 * kFrame, 1000);
  const auto files_after = [&](int32_t dumps) {
    Control(16000, dumps).process(pcm);
    EXPECT_EQ(open_files(), before);
    return std::distance(fs::recursive_directory_iterator(root.path()), {});
  };
  SetDumpRoot(root.path().c_str());
  EXPECT_EQ(files_after(1), 0) << "there is no folder yet";
  fs::create_directory(root.path() / "sdcard");
  for (const int32_t other : {0, 2, -1}) EXPECT_EQ(files_after(other), 1);
  EXPECT_EQ(files_after(1), 3);
}

TEST_F(DynamicsControl, ScalesItsOutput) {
  for (const Word16 scale : {16384, -8192, 0}) {
    DrcInstance *drc = initRecDynamicsControlParameter(16000, 160, scale, 0);
    Model model{.scale = scale};
    Pcm pcm = speech_16k("numbers.raw");
    pcm.resize(pcm.size() / kFrame * kFrame);
    Pcm expected = pcm;
    for (std::size_t at = 0; at < pcm.size(); at += kFrame) model.frame_is_loud(&expected[at]);
    process_drc(drc, pcm.data(), static_cast<Word32>(pcm.size()));
    EXPECT_EQ(pcm, expected) << scale;
    EXPECT_EQ(freeMemory_DRC(drc), 0);
  }
}

}  // namespace
}  // namespace orvalis::test
