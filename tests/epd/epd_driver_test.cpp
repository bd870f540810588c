// The EPD instance and its frame driver, seen through answers, log lines, dump files and counters.
#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <bit>
#include <cmath>
#include <cstdint>
#include <filesystem>
#include <fstream>
#include <initializer_list>
#include <memory>
#include <random>
#include <string>
#include <utility>
#include <vector>

#include "Voice_Engine/epd/epd_instance.h"
#include "basic_op.h"
#include "orvalis.h"
#include "tests/support/log_capture.h"
#include "tests/support/random.h"
#include "tests/support/recordings.h"
#include "tests/support/scripted_malloc.h"
#include "tests/support/scripted_voice.h"
#include "tests/support/temporary_folder.h"

namespace orvalis::test {
namespace {

namespace fs = std::filesystem;
using Pcm = std::vector<std::int16_t>;

const LogLine kNullLine = debug_line("TQE: Null Check fail ... dont do EPD!");
const LogLine kAbnormalLine =
    debug_line("TQE: Check Abnormal Audio ... dont do NS ... in EPD_Proc_Frame");
const LogLine kWaitingLine = debug_line(
    "TQE: Check Abnormal Audio ... wait few more frame ... dont do NS ... in EPD_Proc_Frame");

/// Samples from runs of equal ones: {count, value}.
Pcm runs(std::initializer_list<std::pair<int, int>> parts) {
  Pcm pcm;
  for (const auto &[count, value] : parts)
    pcm.insert(pcm.end(), static_cast<std::size_t>(count), static_cast<std::int16_t>(value));
  return pcm;
}

const Pcm kNormal = runs({{160, 1000}});

struct FreeDetector {
  void operator()(EpdInstance *epd) const { EXPECT_EQ(FreeMemoryEPD(epd), 0); }
};
using Detector = std::unique_ptr<EpdInstance, FreeDetector>;

LogLine version_line(Word32 mode) {
  return debug_line("TQE: libOrvalis.so version 160705 IS127 in EPD Create, EPD MODE : " +
                    std::to_string(mode));
}

LogLine length_line(int samples, int length) {
  return debug_line("VoiceEngine_JNI, Check pcm buffer size : numSample = " +
                    std::to_string(samples) + ", PCM_LEN = " + std::to_string(length));
}

LogLine rate_line(int samples, int sub_mode = 0, int rate_hz = 16000) {
  return debug_line("TQE: Velmora EPD ... numSample = " + std::to_string(samples) +
                    " ... epdMode = " + std::to_string(sub_mode) +
                    " ... RATE : " + std::to_string(rate_hz));
}

std::string number(const EpdInstance *epd) {
  return std::to_string(reinterpret_cast<std::intptr_t>(epd));
}

int32_t process(const Detector &epd, const Pcm &pcm) {
  return ProcessEPDFrame(epd.get(), pcm.data(), static_cast<int32_t>(pcm.size()));
}

std::ptrdiff_t open_files() {
  return std::distance(fs::directory_iterator("/proc/self/fd"), fs::directory_iterator());
}

class EpdDriver : public testing::Test {
protected:
  ~EpdDriver() override { SetDumpRoot(nullptr); }

  /// A detector whose creation and first-call lines are out of the way.
  Detector create(Word32 mode, Word32 dumps = 0) {
    Detector epd(InitializeEPD(mode, dumps));
    ProcessEPDFrame(epd.get(), nullptr, 0);
    log.take();
    return epd;
  }

  /// How one call was screened: 0 for a null frame, x for an abnormal one, w for a wait.
  std::string screening(const Detector &epd, const Pcm &pcm) {
    process(epd, pcm);
    std::string result;
    for (const LogLine &line : log.take()) {
      if (line == kNullLine) result += '0';
      if (line == kAbnormalLine) result += 'x';
      if (line == kWaitingLine) result += 'w';
    }
    return result;
  }

  /// Makes the folder of the dump files under a root of the test's own.
  fs::path make_dump_folder() {
    SetDumpRoot(root.path().c_str());
    const fs::path folder = root.path() / "sdcard" / "VRpreprocess";
    fs::create_directories(folder);
    return folder;
  }

  LogCapture log;
  const TemporaryFolder root;
};

TEST_F(EpdDriver, UnpacksTheMode) {
  // mode, sub-mode, rate, gain
  constexpr Word32 kCases[][4] = {{0, 0, 0, 0},
                                  {4, 0, 0, 0},
                                  {3, 3, 0, 0},
                                  {-3, 0, 0, 0},
                                  {1000, 0, 1, 0},
                                  {2000, 0, 0, 0},
                                  {9002, 2, 0, 0},
                                  {-1000, 0, -1, 0},
                                  {10000, 0, 0, 1},
                                  {21001, 1, 1, 2},
                                  {-11001, 0, -1, -1},
                                  {999, 0, 0, 0},
                                  {INT32_MAX, 0, 0, 214748},
                                  {INT32_MIN, 0, -3, -214748}};
  for (const auto &[mode, sub_mode, rate_mode, gain] : kCases) {
    Detector epd(InitializeEPD(mode, 0));
    const std::string id = number(epd.get());
    EXPECT_EQ(log.take(), LogLines{version_line(mode)});
    EXPECT_EQ(epd->rateMode, rate_mode) << mode;
    EXPECT_EQ(epd->inputGainMode, gain) << mode;
    const bool wide = rate_mode == 0;
    const int length = wide ? 160 : 80;
    EXPECT_EQ(process(epd, runs({{length, 1000}})), 0);
    EXPECT_EQ(log.take().at(0), rate_line(length, sub_mode, wide ? 16000 : 8000));
    EXPECT_EQ(epd->processedSamples, length);
    EXPECT_EQ(epd->suppressor.frame_cnt, wide ? 1 : 0);
    EXPECT_TRUE(mode != 4 || epd->secondary_suppressor.frame_cnt == 0);
    log.take();
    epd.reset();
    EXPECT_EQ(log.take(), LogLines{debug_line("TQE: free EPD memory id : " + id)});
  }
  EXPECT_STREQ(GetVersion(), "160705");
}

TEST_F(EpdDriver, RefusesWhatIsNotThere) {
  const Detector epd = create(0);
  const std::int16_t sample = 0;
  for (const auto process_by : {ProcessEPDFrameByCnttype, ProcessEPDFrameByMode}) {
    EXPECT_EQ(process_by(nullptr, &sample, 160, 0), -1);
    EXPECT_EQ(process_by(epd.get(), nullptr, 160, 0), -1);
    EXPECT_EQ(process_by(epd.get(), nullptr, 0, 0), 0);
  }
  EXPECT_EQ(ProcessEPDFrame(nullptr, &sample, 160), -1);
  EXPECT_EQ(ProcessEPDFrame(nullptr, nullptr, 0), -1);
  EXPECT_EQ(ProcessEPDFrame(epd.get(), nullptr, 1), -1);
  EXPECT_EQ(ResetEPDparams(nullptr), -1);
  EXPECT_EQ(setLogging(nullptr, 1), -1);
  log.take();
  EXPECT_EQ(FreeMemoryEPD(nullptr), -1);
  EXPECT_EQ(log.take(), LogLines{debug_line("TQE: free EPD memory id : 0")});
  EXPECT_EQ(FreeMemoryEPD(reinterpret_cast<EpdInstance *>(std::intptr_t{-1})), -1);
  EXPECT_EQ(log.take(), LogLines{debug_line("TQE: free EPD memory id : -1")});

  const auto no_memory = ScriptedMalloc::failing();
  EXPECT_EQ(InitializeEPD(21001, 1), nullptr);
  EXPECT_EQ(log.take(), LogLines{version_line(21001)});
}

TEST_F(EpdDriver, JudgesCountsAndPartialFrames) {
  const Detector epd(InitializeEPD(0, 0));
  log.take();
  EXPECT_EQ(ProcessEPDFrame(epd.get(), kNormal.data(), 0), 0);
  EXPECT_EQ(log.take(), LogLines{rate_line(0)});
  EXPECT_EQ(ProcessEPDFrame(epd.get(), kNormal.data(), -160), 0);
  EXPECT_EQ(log.take(), LogLines{rate_line(-160)});
  EXPECT_EQ(ProcessEPDFrame(epd.get(), kNormal.data(), -7), 0);
  EXPECT_EQ(log.take(), (LogLines{length_line(-7, 160), rate_line(-7)}));
  EXPECT_EQ(epd->kepd.frame_cnt, 0);

  // The whole frame of a partial call is judged; only the call's own bookkeeping is dropped.
  ScriptedVoice voice;
  for (int call = 1; call <= 2; ++call) {
    EXPECT_EQ(process(epd, runs({{300, 1000}})), 0);
    const LogLines lines = log.take();
    EXPECT_EQ(lines.at(0), length_line(300, 160));
    EXPECT_EQ(lines.at(1), rate_line(300));
    EXPECT_EQ(std::count(lines.begin(), lines.end(), kWaitingLine), 0) << "was the first frame";
    EXPECT_EQ(epd->kepd.frame_cnt, call);
    EXPECT_EQ(epd->suppressor.frame_cnt, call);
    EXPECT_EQ(epd->HANGframe, call);
    EXPECT_EQ(epd->processedSamples, 0);
    EXPECT_EQ(epd->abnormalCheckCount, 0);
  }
  voice.says(true);
  for (int frame = 0; frame < 60; ++frame) process(epd, kNormal);
  EXPECT_EQ(process(epd, kNormal), 1);
  EXPECT_EQ(process(epd, runs({{300, 1000}})), 0) << "speech of a partial call is not told";
  EXPECT_EQ(process(epd, runs({{480, 1000}})), 1);
  EXPECT_EQ(epd->processedSamples, 64 * 160);

  const Detector narrow = create(1000);
  process(narrow, runs({{90, 1000}}));
  EXPECT_EQ(log.take().at(0), length_line(90, 80));
}

TEST_F(EpdDriver, LeavesNullFramesOut) {
  const Detector epd = create(0);
  ScriptedVoice voice;
  EXPECT_EQ(screening(epd, runs({{99, 7}, {61, 0}})), "0");
  EXPECT_EQ(screening(epd, runs({{20, 7}, {80, 0}, {60, 7}})), "0");
  EXPECT_EQ(epd->kepd.frame_cnt, 0);
  EXPECT_EQ(epd->HANGframe, -1);
  EXPECT_EQ(epd->suppressor.frame_cnt, 0);
  EXPECT_EQ(epd->noise_floor.noise_frames, 0);
  EXPECT_EQ(epd->abnormalCheckCount, 0);
  EXPECT_EQ(epd->processedSamples, 320);
  EXPECT_EQ(screening(epd, runs({{60, 0}, {1, 7}, {60, 0}, {39, 7}})), "w");
  EXPECT_EQ(screening(epd, runs({{100, 7}, {60, 0}, {60, 0}, {100, 7}})), "ww");
  EXPECT_EQ(epd->kepd.frame_cnt, 3);

  const Detector narrow = create(1000);
  EXPECT_EQ(screening(narrow, runs({{19, 7}, {61, 0}, {20, 7}, {60, 0}})), "0w");
  EXPECT_EQ(narrow->processedSamples, 160);

  voice.says(true);
  for (int frame = 0; frame < 60; ++frame) process(epd, kNormal);
  EXPECT_EQ(process(epd, runs({{160, 0}})), 0);
  EXPECT_EQ(process(epd, runs({{160, 9}, {160, 0}})), 1);
  EXPECT_EQ(epd->HANGframe, -1);
}

TEST_F(EpdDriver, HoldsSuppressionBackUntilAudioSettles) {
  const auto frames = [](const std::string &kinds) {
    Pcm pcm;
    for (const char kind : kinds) {
      const int small = kind == 'a' ? 160 : kind == 'h' ? 60 : 0;  // 120 make a call abnormal
      const Pcm frame = runs({{small, -2}, {160 - small, kind == 'z' ? 0 : 1000}});
      pcm.insert(pcm.end(), frame.begin(), frame.end());
    }
    return pcm;
  };
  ScriptedVoice voice;
  const struct {
    std::string kinds, screened;
    int suppressed;
  } calls_of_one_frame[] = {{"nanan", "", 5},
                            {"annnna", "xwww", 2},
                            {"annannnn", "xwwxwww", 1},
                            {"znzznnn", "0w00ww", 1},
                            {"hhhh", "", 4},
                            {std::string(20, 'a'), std::string(19, 'x'), 1}};
  for (const auto &[kinds, screened, suppressed] : calls_of_one_frame) {
    const Detector epd = create(0);
    std::string seen;
    for (const char kind : kinds) seen += screening(epd, frames({kind}));
    EXPECT_EQ(seen, screened) << kinds;
    EXPECT_EQ(epd->suppressor.frame_cnt, suppressed) << kinds;
  }

  // Small samples add up over the frames of a call, not over calls.
  const struct {
    std::vector<Pcm> calls;
    std::string screened;
  } calls[] = {
      {{frames("zhhn")}, "0wxx"},
      {{frames("zh"), frames("hn")}, "0www"},
      {{frames("hhh")}, ""},
      {{runs({{120, 3}, {40, 1000}})}, "x"},
      {{runs({{119, 3}, {41, 1000}})}, ""},
      {{runs({{30, 4}, {30, -4}, {30, 1}, {30, -1}, {40, 1000}})}, "x"},
      {{runs({{119, 4}, {20, 5}, {21, -5}})}, ""},
      {{runs({{60, 0}, {1, 9}, {60, 0}, {39, 9}})}, ""},
      // A null frame counts up to its 61st zero.
      {{runs({{50, 3}, {61, 0}, {49, 3}, {69, 3}, {91, 1000}})}, "0w"},
      {{runs({{50, 3}, {61, 0}, {49, 3}, {70, 3}, {90, 1000}})}, "0x"},
  };
  for (const auto &[parts, screened] : calls) {
    const Detector epd = create(0);
    std::string seen;
    for (const Pcm &pcm : parts) seen += screening(epd, pcm);
    EXPECT_EQ(seen, screened) << &parts - &calls[0].calls;
  }

  // The input is judged as it came, before the gain.
  EXPECT_EQ(screening(create(10000), runs({{160, 16}})), "");
  EXPECT_EQ(screening(create(20000), runs({{160, 4}})), "x");

  // At 8 kHz the same states are kept though nothing is ever suppressed.
  const Detector narrow = create(1000);
  EXPECT_EQ(screening(narrow, runs({{80, 0}, {240, 2}})), "0wxx");
  EXPECT_EQ(narrow->abnormalCheckCount, 0);
  EXPECT_EQ(screening(narrow, runs({{400, 9}})), "www");
  EXPECT_EQ(screening(narrow, runs({{400, 2}})), "");
  EXPECT_EQ(screening(create(1000), runs({{400, 2}})), "") << "the first frame was normal";
  EXPECT_EQ(screening(create(1000), runs({{80, 0}, {3360, 2}})), "0w" + std::string(37, 'x'));
  EXPECT_EQ(narrow->suppressor.frame_cnt, 0);
}

TEST_F(EpdDriver, DecidesOnSuppressedAudioAndTracksNoiseBefore) {
  const Pcm pcm = speech_16k("numbers.raw");
  const Detector epd = create(0);
  ScriptedVoice voice;
  for (std::size_t at = 0; at < 40 * 160; at += 160) {
    const Pcm frame(&pcm[at], &pcm[at + 160]);
    S1chnsState suppressor = epd->suppressor;
    Pcm suppressed = frame;
    NsFlags flags;
    s1chns_C(flags, &suppressor, suppressed.data(), suppressed.data());
    process(epd, frame);
    ASSERT_EQ(voice.heard_frame, suppressed);
    ASSERT_NE(voice.heard_frame, frame);
    ASSERT_EQ(epd->noise_floor.energy_hist[at / 160], getAbsoluteEnergy(frame.data(), 0));
  }
  const Detector narrow = create(1000);
  const Pcm frame(&pcm[8000], &pcm[8080]);
  process(narrow, frame);
  EXPECT_EQ(voice.heard_frame, frame);
}

TEST_F(EpdDriver, LogsTheHangover) {
  const Detector epd = create(0);
  const std::string id = number(epd.get());
  const LogLine started = debug_line(id + ":TQE: vm_sum ... JAVA HANGOVER started!");
  const auto counted = [&](int frames) {
    return debug_line(id + ":TQE: _vm_sum ... HANGframe = " + std::to_string(frames));
  };
  const LogLine reset = info_line("TQE: reset KEPDfunc params");
  ScriptedVoice voice;
  const auto hear = [&](bool voiced, int frames) {
    voice.says(voiced);
    while (frames-- > 0) process(epd, kNormal);
    return log.take();
  };
  EXPECT_EQ(hear(false, 1), (LogLines{rate_line(160), started}));
  EXPECT_EQ(hear(false, 8), LogLines{});
  EXPECT_EQ(hear(false, 1), LogLines{counted(10)});
  EXPECT_EQ(hear(false, 30), (LogLines{counted(20), counted(30), counted(40)}));
  EXPECT_EQ(hear(true, 5), LogLines{});
  EXPECT_EQ(hear(true, 1).size(), 1U) << "the onset's own line";
  EXPECT_EQ(epd->HANGframe, -1);
  EXPECT_EQ(hear(false, 24), LogLines{}) << "a pause is not yet hangover";
  EXPECT_EQ(hear(false, 1), LogLines{started}) << "end of speech";
  EXPECT_EQ(epd->HANGframe, 1);

  EXPECT_EQ(ResetEPDparams(epd.get()), 0);
  EXPECT_EQ(epd->HANGframe, 0);
  EXPECT_EQ(log.take(), LogLines{reset});
  EXPECT_EQ(hear(false, 10), (LogLines{started, counted(10)}));
  EXPECT_EQ(setLogging(epd.get(), 1), 0);
  EXPECT_EQ(log.take(),
            LogLines{debug_line("TQE: EPD(" + id + ") LOG is disabled before ResetEPD")});
  EXPECT_EQ(hear(false, 20), LogLines{});
  EXPECT_EQ(epd->HANGframe, 30) << "counts on in silence";
  ResetEPDparams(epd.get());
  EXPECT_EQ(log.take(), LogLines{reset});
  EXPECT_EQ(hear(false, 1), LogLines{started});
}

TEST_F(EpdDriver, HandsTheContentTypeOn) {
  ScriptedVoice voice;
  // Voiced frames until speech is answered, behind the deaf ones.
  const auto onset = [&](Word32 mode, auto process_frame, auto... type) {
    const Detector epd = create(mode);
    const int32_t length = epd->rateMode == 0 ? 160 : 80;
    int frames = 0;
    int32_t answer = 0;
    while (answer == 0 && frames++ < 99) {
      voice.says(frames > 39);
      answer = process_frame(epd.get(), kNormal.data(), length, type...);
    }
    return frames - 39;
  };
  EXPECT_EQ(onset(0, ProcessEPDFrame), 6);
  EXPECT_EQ(onset(3, ProcessEPDFrame), 6);
  EXPECT_EQ(onset(1000, ProcessEPDFrame), 6);
  EXPECT_EQ(onset(-1000, ProcessEPDFrame), 4) << "a negative rate is a large content type";
  for (const Word32 mode : {0, 1000}) {
    for (const Word32 type : {0, 1, 2, 9, -1}) {
      const int expected = type == 0 || type == 1 ? 6 : 4;
      EXPECT_EQ(onset(mode, ProcessEPDFrameByCnttype, type), expected) << type;
      EXPECT_EQ(onset(mode, ProcessEPDFrameByMode, type), expected) << type;
    }
  }
}

TEST_F(EpdDriver, DumpsScaledInputAndAnswers) {
  const fs::path folder = make_dump_folder();
  EXPECT_EQ(SetDumpRoot(std::string(250, 'x').c_str()), -1);
  auto random = seeded_generator();
  ScriptedVoice voice;
  for (const Word32 mode : {0, 10000, 20000, 21001, 30000, 11000}) {
    const int length = mode / 1000 % 10 == 1 ? 80 : 160;
    const int gain = mode / 10000;
    Detector epd = create(mode, 1);
    const std::string stem = folder / number(epd.get());
    Pcm expected_input;
    Pcm expected_answers;
    for (int frame = 1; frame <= 90; ++frame) {
      if (frame == 60) process(epd, runs({{length, 0}}));  // null audio leaves no trace
      Pcm pcm = {-32768, 32767, -1, 3, -4, -5, 8191, 8192, -8193};
      while (std::ssize(pcm) < length) pcm.push_back(static_cast<std::int16_t>(random() | 1));
      voice.says(frame > 39 && frame <= 50);
      const int end = length == 160 ? 75 : 78;
      const int answer = frame < 45 || frame > end ? 0 : frame < end ? 1 : 2;
      EXPECT_EQ(process(epd, pcm), answer != 0) << frame;
      expected_answers.insert(expected_answers.end(), length, Word16(1000 * answer));
      for (const int x : pcm) {
        const int y = gain == 1 ? int(std::floor(x / 4.0)) : gain == 2 ? x * 4 : x;
        expected_input.push_back(static_cast<Word16>((y % 65536 + 98304) % 65536 - 32768));
      }
    }
    EXPECT_EQ(epd->suppressor.frame_cnt > 0, length == 160);
    epd.reset();
    EXPECT_EQ(load_recording(stem + "_inputEPD.pcm"), expected_input) << mode;
    EXPECT_EQ(load_recording(stem + "_resultEPD.pcm"), expected_answers) << mode;
    fs::remove(stem + "_inputEPD.pcm");
    fs::remove(stem + "_resultEPD.pcm");
    EXPECT_TRUE(fs::is_empty(folder)) << "there were other files";
  }
}

TEST_F(EpdDriver, LeavesBothDumpFilesBehindEachCallAndNoHandle) {
  const fs::path folder = make_dump_folder();
  const auto before = open_files();
  {
    const Detector epd = create(0, 1);
    EXPECT_EQ(open_files(), before + 2);
    const fs::path input = folder / (number(epd.get()) + "_inputEPD.pcm");
    const fs::path result = folder / (number(epd.get()) + "_resultEPD.pcm");
    for (const Pcm &pcm : {Pcm{}, runs({{160, 0}}), kNormal, runs({{300, 1000}}), Pcm{1}}) {
      fs::remove(input);
      fs::remove(result);
      process(epd, pcm);
      EXPECT_TRUE(fs::exists(input) && fs::exists(result)) << pcm.size();
      EXPECT_EQ(open_files(), before + 2) << pcm.size();
    }
  }
  EXPECT_EQ(open_files(), before);
}

TEST_F(EpdDriver, DoesWithoutDumpFiles) {
  SetDumpRoot(root.path().c_str());
  ScriptedVoice voice;
  const auto before = open_files();
  const auto works = [&](Word32 dumps) {
    const Detector epd = create(0, dumps);
    voice.says(true);
    int32_t answer = 0;
    for (int frame = 0; frame < 45; ++frame) answer = process(epd, kNormal);
    EXPECT_EQ(answer, 1);
    EXPECT_EQ(open_files(), before);
  };
  works(1);  // no folder
  std::ofstream(root.path() / "sdcard") << "a file stands where the folder should be";
  works(1);
  fs::remove(root.path() / "sdcard");
  const fs::path folder = make_dump_folder();
  for (const Word32 dumps : {0, 2, -1}) works(dumps);  // only 1 asks for them
  EXPECT_TRUE(fs::is_empty(folder));
}

/// Low square waves of full scale between breaths of noise: what saturates most after suppression.
Pcm loud_waves(int length, int frame) {
  static std::mt19937 random(1);
  Pcm pcm;
  const bool quiet = frame < 20 || frame % 50 < 10;
  for (int at = frame * length; std::ssize(pcm) < length; ++at)
    pcm.push_back(quiet ? static_cast<Word16>(random() % 20 + 1) : at / 50 % 2 ? MAX_16 : MIN_16);
  return pcm;
}

TEST_F(EpdDriver, LeavesTheOperatorsFlags) {
  static constexpr Word32 kBefore = 7;  // no operator writes it
  const auto flags_after = [](const Detector &epd, const Pcm &pcm) {
    Overflow = Carry = ns_Overflow = ns_Carry = Overflow_ZOLT = Carry_ZOLT = kBefore;
    process(epd, pcm);
    for (const Word32 untouched : {Carry, ns_Carry, Word32{Overflow_ZOLT}, Word32{Carry_ZOLT}})
      EXPECT_EQ(untouched, kBefore);
    return std::array{Overflow, ns_Overflow};
  };
  const Detector held_back = create(0);
  EXPECT_EQ(flags_after(held_back, runs({{160, 0}})), (std::array{kBefore, kBefore}));
  EXPECT_EQ(flags_after(held_back, {}), (std::array{kBefore, kBefore}));
  EXPECT_EQ(flags_after(held_back, runs({{160, 3}}))[1], kBefore);
  EXPECT_EQ(held_back->kepd.frame_cnt, 1);

  int saturated_frames = 0;
  for (const Word32 mode : {0, 1000}) {
    const Detector epd = create(mode);
    for (int frame = 0; frame < 1000; ++frame) {
      const Pcm pcm = loud_waves(mode == 0 ? 160 : 80, frame);
      S1chnsState suppressor = epd->suppressor;
      Pcm heard = pcm;
      NsFlags unused;
      if (mode == 0) s1chns_C(unused, &suppressor, heard.data(), heard.data());
      VelmoraVadState vad = epd->vad;
      VelmoraVadState *detector = &vad;
      PlainFlags flags;
      flags.overflow = kBefore;
      processVelmoraVAD(flags, &detector, heard.data(), &epd->kepd.EnergyTHscore, epd->rateMode);
      const bool saturated = heard.back() == MAX_16 || heard.back() == MIN_16;
      saturated_frames += mode == 0 && saturated;
      ASSERT_EQ(flags_after(epd, pcm),
                (std::array{flags.overflow, mode == 0 ? Word32{saturated} : kBefore}))
          << mode << ", frame " << frame;
    }
  }
  EXPECT_GT(saturated_frames, 50);
  EXPECT_LT(saturated_frames, 950);
}

/// What an instance knows that no dirt in its memory may move, after each frame of a recording.
std::vector<std::array<Word64, 16>> trace(Word32 mode, const Pcm &pcm) {
  const Detector epd(InitializeEPD(mode, 0));
  const std::size_t length = epd->rateMode == 0 ? 160 : 80;
  std::vector<std::array<Word64, 16>> frames;
  for (std::size_t at = 0; at + length <= pcm.size(); at += length) {
    const int32_t answer = ProcessEPDFrame(epd.get(), &pcm[at], static_cast<int32_t>(length));
    const KepdState &k = epd->kepd;
    const Word64 noise_energy = std::bit_cast<Word32>(epd->noise_floor.noise_energy);
    frames.push_back({answer, epd->HANGframe, epd->abnormalCheckCount, epd->processedSamples,
                      epd->vad.vad_flag, epd->vad.tot_enrg, epd->vad.energy_th, noise_energy,
                      epd->suppressor.de_emp_mem, epd->suppressor.update_cnt, k.onset_cnt,
                      k.pause_cnt, k.in_speech, k.speech_frames, k.frame_cnt,
                      std::bit_cast<Word32>(k.EnergyTHscore)});
  }
  return frames;
}

TEST_F(EpdDriver, ReadsNothingItHasNotWritten) {
  const Pcm wide = speech_16k("numbers.raw");
  const Pcm narrow = speech_8k("raw/hts1a.raw");
  Pcm with_hiss = runs({{160, 0}, {800, 3}});  // suppression starts late
  with_hiss.insert(with_hiss.end(), wide.begin(), wide.end());
  const std::pair<Word32, const Pcm *> cases[] = {
      {0, &wide}, {4, &wide}, {20000, &wide}, {0, &with_hiss}, {1000, &narrow}, {-1000, &narrow}};
  for (const auto &[mode, pcm] : cases) {
    const auto run_with = [mode = mode, pcm = pcm](int dirt) {
      const auto memory = ScriptedMalloc::filling(dirt);
      return trace(mode, *pcm);
    };
    const auto clean = run_with(0x00);
    EXPECT_EQ(run_with(0xFF), clean) << mode;
    EXPECT_EQ(run_with(0xA5), clean) << mode;
    const auto spoken =
        std::count_if(clean.begin(), clean.end(), [](const auto &frame) { return frame[0] == 1; });
    EXPECT_GT(spoken, 20) << mode;
    EXPECT_LT(spoken, std::ssize(clean) - 39) << mode;
  }
}

TEST_F(EpdDriver, FoldsTheFramesOfACall) {
  const std::pair<Word32, Pcm> cases[] = {{0, speech_16k("numbers.raw")},
                                          {0, speech_16k("cards/001.wav")},
                                          {1000, speech_8k("wav/vk5qi.wav")}};
  int mixed_calls = 0;
  for (const auto &[mode, pcm] : cases) {
    const Detector single = create(mode);
    const Detector tenfold = create(mode);
    const int32_t length = mode == 0 ? 160 : 80;
    for (std::size_t at = 0; at + 10 * length <= pcm.size(); at += 10 * length) {
      int spoken = 0;
      for (int frame = 0; frame < 10; ++frame)
        spoken += ProcessEPDFrame(single.get(), &pcm[at + frame * length], length);
      ASSERT_EQ(ProcessEPDFrame(tenfold.get(), &pcm[at], 10 * length), spoken > 0) << at;
      mixed_calls += spoken > 0 && spoken < 10;
      ASSERT_EQ(single->abnormalCheckCount, 3) << "the frames were not normal";
      ASSERT_EQ(tenfold->abnormalCheckCount, 3);
      ASSERT_EQ(tenfold->processedSamples, single->processedSamples);
      ASSERT_EQ(tenfold->HANGframe, single->HANGframe);
      ASSERT_EQ(tenfold->kepd.frame_cnt, single->kepd.frame_cnt);
      ASSERT_EQ(tenfold->kepd.speech_frames, single->kepd.speech_frames);
    }
  }
  EXPECT_GT(mixed_calls, 4);
}

TEST_F(EpdDriver, CountersStopAtTheirEnd) {
  const Detector epd = create(0);
  ScriptedVoice voice;
  epd->processedSamples = epd->kepd.frame_cnt = epd->HANGframe = INT32_MAX - 1;
  epd->noise_floor.noise_frames = INT32_MAX - 1;
  for (int frame = 0; frame < 3; ++frame) process(epd, kNormal);
  EXPECT_EQ(epd->processedSamples, INT32_MAX);
  EXPECT_EQ(epd->kepd.frame_cnt, INT32_MAX);
  EXPECT_EQ(epd->HANGframe, INT32_MAX);
  EXPECT_EQ(epd->noise_floor.noise_frames, INT32_MAX);
  EXPECT_EQ(epd->noise_floor.energy_hist[44], getAbsoluteEnergy(kNormal.data(), 0));
}

}  // namespace
}  // namespace orvalis::test
