// The EPD instance and its frame driver, seen through decisions, log lines, dump files, flags and
// counters.
#include <fcntl.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <bit>
#include <cmath>
#include <cstdint>
#include <cstdio>
#include <filesystem>
#include <fstream>
#include <memory>
#include <random>
#include <string>
#include <tuple>
#include <utility>
#include <vector>

#include "Voice_Engine/epd/epd_instance.h"
#include "orvalis.h"
#include "tests/support/flag_words.h"
#include "tests/support/log_capture.h"
#include "tests/support/random.h"
#include "tests/support/recordings.h"
#include "tests/support/scripted_malloc.h"
#include "tests/support/temporary_folder.h"

namespace orvalis::test {
namespace {

namespace fs = std::filesystem;

const Pcm kNormal(160, 1000);

struct FreeDetector {
  void operator()(EpdInstance *epd) const { EXPECT_EQ(FreeMemoryEPD(epd), 0); }
};
using Detector = std::unique_ptr<EpdInstance, FreeDetector>;

LogLine version_line(Word32 mode) {
  return debug_line("TQE: libOrvalis.so version 160705 IS127 in EPD Create, EPD MODE : %d", mode);
}

long number(const EpdInstance *epd) { return reinterpret_cast<std::intptr_t>(epd); }

int32_t process(const Detector &epd, const Pcm &pcm) {
  return ProcessEPDFrame(epd.get(), pcm.data(), static_cast<int32_t>(pcm.size()));
}

std::ptrdiff_t open_files() {
  return std::distance(fs::directory_iterator("/proc/self/fd"), fs::directory_iterator());
}

template <class Record>
auto words(const Record &record) {
  return std::bit_cast<std::array<Word32, sizeof(Record) / sizeof(Word32)>>(record);
}

/// The state of an instance.
auto snapshot(const EpdInstance &epd) {
  const VelmoraVadState &vad = epd.vad;
  const S1chnsState &suppressor = epd.suppressor;
  return std::tuple(epd.epdMode, epd.rateMode, epd.inputGainMode, epd.hangLogEnabled,
                    epd.processedSamples, epd.abnormalCheckCount, epd.HANGframe, words(epd.kepd),
                    words(epd.noise_floor), vad.vad_flag, vad.tot_enrg, vad.energy_th,
                    suppressor.frame_cnt, suppressor.de_emp_mem, suppressor.update_cnt);
}

class EpdDriver : public testing::Test {
protected:
  ~EpdDriver() override { SetDumpRoot(nullptr); }

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

// ---- The driver a second time, as the list of its steps on the engine's parts ----

struct Mode {
  Word32 mode, sub_mode, rate, gain;
};
constexpr Mode kModes[] = {{0, 0, 0, 0},
                           {4, 0, 0, 0},
                           {3, 3, 0, 0},
                           {-3, 0, 0, 0},
                           {1000, 0, 1, 0},
                           {9002, 2, 0, 0},
                           {-1000, 0, -1, 0},
                           {10000, 0, 0, 1},
                           {20000, 0, 0, 2},
                           {21001, 1, 1, 2},
                           {-11001, 0, -1, -1},
                           {INT32_MAX, 0, 0, 214748},
                           {INT32_MIN, 0, -3, -214748}};

struct DriverModel {
  DriverModel(const Mode &mode, long number, LogCapture &capture)
      : id(number), log(capture), length(mode.rate == 0 ? 160 : 80) {
    record.epdMode = mode.sub_mode;
    record.rateMode = mode.rate;
    record.inputGainMode = mode.gain;
    record.hangLogEnabled = 1;
    record.HANGframe = -1;
    S1CHNSInit(&record.suppressor, 2);
    InitKEPD(&handle);
    InitNoiseEstimation(&handle);
  }

  void keep(const LogLine &said) { lines.push_back(said); }

  Word32 process(const Pcm &pcm, Word32 samples, Word32 type) {
    const Word16 calm_before = record.abnormalCheckCount;
    const Word32 heard_before = record.processedSamples;
    if (samples % length != 0)
      keep(debug_line("VoiceEngine_JNI, Check pcm buffer size : numSample = %d, PCM_LEN = %d",
                      samples, length));
    if (heard_before == 0)
      keep(debug_line("TQE: Velmora EPD ... numSample = %d ... epdMode = %d ... RATE : %d", samples,
                      record.epdMode, 100 * length));
    int small_samples = 0;
    bool spoken = false;
    for (int at = 0; at + length <= samples; at += length) {
      record.processedSamples += length;
      const Pcm frame(&pcm[at], &pcm[at] + length);
      if (is_null(frame, small_samples)) {
        keep(debug_line("TQE: Null Check fail ... dont do EPD!"));
      } else {
        spoken |= decide(frame, small_samples < 120, type) != 0;
      }
    }
    if (samples % length == 0) return spoken;
    // The whole frames of a partial call are processed; only the call's own counts are dropped.
    record.abnormalCheckCount = calm_before;
    record.processedSamples = heard_before;
    return 0;
  }

  static bool is_null(const Pcm &frame, int &small_samples) {
    int zeros = 0;
    for (const int x : frame) {
      zeros = x == 0 ? zeros + 1 : 0;
      if (zeros == 61) return true;
      small_samples += x != 0 && std::abs(x) < 5;
    }
    return false;
  }

  Word32 decide(Pcm frame, bool is_normal, Word32 type) {
    for (Word16 &x : frame) {
      const int scaled = record.inputGainMode == 1   ? static_cast<int>(std::floor(x / 4.0))
                         : record.inputGainMode == 2 ? x * 4
                                                     : x;
      x = static_cast<Word16>((scaled % 65536 + 98304) % 65536 - 32768);
    }
    Pcm suppressed = frame;
    Word16 &calm = record.abnormalCheckCount;
    const bool starts_normal = record.processedSamples == length && is_normal;
    if (starts_normal || calm == 3 || record.processedSamples >= 3200) {
      calm = 3;
      if (length == 160) s1chns_C(ns_flags, &record.suppressor, &suppressed[0], &suppressed[0]);
    } else {
      calm = static_cast<Word16>(is_normal ? calm + 1 : 0);
      keep(debug_line("TQE: Check Abnormal Audio ...%s dont do NS ... in EPD_Proc_Frame",
                      is_normal ? " wait few more frame ..." : ""));
    }
    const Word32 decision =
        KEPDfunc(flags, &handle, suppressed.data(), static_cast<std::uint32_t>(type), reasons);
    for (const LogLine &said : log.take()) keep(said);
    KEPDfunc_NoiseEstimation(&handle, frame.data(), decision);
    dumped_input.insert(dumped_input.end(), frame.begin(), frame.end());
    dumped_decisions.insert(dumped_decisions.end(), frame.size(),
                            static_cast<Word16>(1000 * decision));
    count_hangover(decision == 1);
    return decision;
  }

  void count_hangover(bool speech) {
    Word32 &frames = record.HANGframe;
    const bool starts = !speech && frames <= 0;
    frames = speech ? -1 : starts ? 1 : frames + 1;
    if (record.hangLogEnabled == 0) return;
    if (starts) keep(debug_line("%ld:TQE: vm_sum ... JAVA HANGOVER started!", id));
    if (frames % 10 == 0) keep(debug_line("%ld:TQE: _vm_sum ... HANGframe = %d", id, frames));
  }

  void reset() {
    record.HANGframe = 0;
    record.hangLogEnabled = 1;
    KEPDfunc_Reset(&handle);
    log.take().swap(lines);
  }

  void stop_logging() {
    record.hangLogEnabled = 0;
    keep(debug_line("TQE: EPD(%ld) LOG is disabled before ResetEPD", id));
  }

  const long id;
  LogCapture &log;
  EpdInstance record{};
  EpdInstance *handle = &record;
  const int length;
  Flags flags;
  EpdReasons reasons{};
  Flags ns_flags;
  LogLines lines;
  Pcm dumped_input, dumped_decisions;
};

/// A frame at the limits of screening: so many samples of magnitude 4, so many zeros in a row.
Pcm limit_frame(std::mt19937_64 &random, int length) {
  const auto one_of = [&](const auto &values) { return values[random() % std::size(values)]; };
  const bool barely_loud = random() % 2 == 0;
  const int small = std::min(length, one_of(std::array{0, 20, 30, 40, 59, 60, 119, 120, 160}));
  const int zeros = std::min(length, one_of(std::array{0, 0, 0, 0, 60, 60, 61, 160}));
  Pcm frame(length);
  for (int i = 0; i < length; ++i) {
    const int loud = barely_loud ? one_of(std::array{-5, 5}) : static_cast<Word16>(random()) | 64;
    frame[i] = static_cast<Word16>(i < small ? one_of(std::array{-4, -1, 1, 4}) : loud);
  }
  std::fill_n(frame.begin() + random() % (length - zeros + 1), zeros, Word16{0});
  return frame;
}

/// Low-pitched square waves of full scale between noise: what saturates most after suppression.
Pcm loud_wave(std::mt19937_64 &random, int length, int frame) {
  Pcm pcm;
  const bool quiet = frame < 20 || frame % 50 < 10;
  for (int at = frame * length; std::ssize(pcm) < length; ++at)
    pcm.push_back(quiet ? static_cast<Word16>(random() % 20 + 1) : at / 50 % 2 ? MAX_16 : MIN_16);
  return pcm;
}

TEST_F(EpdDriver, FollowsItsSteps) {
  constexpr Word32 kBefore = 7;  // no operator writes it
  const fs::path folder = make_dump_folder();
  auto random = seeded_generator();
  const auto one_of = [&](const auto &values) { return values[random() % std::size(values)]; };
  const auto one_in = [&](int cases) { return random() % cases == 0; };
  std::array<int, 2> spoken{};
  std::array<int, 8> ns_raised{};  // by what the word held
  for (int sequence = 0; sequence < 400; ++sequence) {
    SCOPED_TRACE(sequence);
    const Mode &mode = one_of(kModes);
    const bool dumps = one_in(2);
    Detector epd(InitializeEPD(mode.mode, dumps ? 1 : 0));
    const long id = number(epd.get());
    ASSERT_EQ(log.take(), LogLines{version_line(mode.mode)});
    DriverModel model(mode, id, log);
    const auto said_as_expected = [&] { EXPECT_EQ(log.take(), std::exchange(model.lines, {})); };
    enum {
      kLoud,
      kLimits,
      kHiss,
      kSteady
    } const audio = one_of(std::array{kLoud, kLimits, kHiss, kSteady});
    int frames = 0;
    for (int call = 0; call < 120; ++call) {
      Pcm pcm;
      for (int more = one_in(20) ? 0 : one_in(4) ? 3 : 1; more > 0; --more, ++frames) {
        const Pcm frame = audio == kLoud ? loud_wave(random, model.length, frames)
                          : audio == kLimits || one_in(40)
                              ? limit_frame(random, model.length)
                              : Pcm(model.length, audio == kHiss ? 3 : Word16(random() | 64));
        pcm.insert(pcm.end(), frame.begin(), frame.end());
      }
      pcm.resize(pcm.size() + (one_in(20) ? random() % 100 : 0), 1000);
      Word32 samples = static_cast<Word32>(pcm.size());
      pcm.push_back(0);
      if (one_in(50)) samples = -samples;
      const Word32 type = one_of(std::array{0, 1, 2, 9, -1});
      const auto entry = one_of(std::array{ProcessEPDFrameByCnttype, ProcessEPDFrameByMode});
      const bool by_rate = audio == kSteady;
      model.flags.overflow = model.ns_flags.overflow = kBefore;
      const Word32 expected = model.process(pcm, samples, by_rate ? mode.rate : type);
      write_flags({kBefore, kBefore, kBefore, kBefore, kBefore, kBefore});
      const Word32 got = by_rate ? ProcessEPDFrame(epd.get(), pcm.data(), samples)
                                 : entry(epd.get(), pcm.data(), samples, type);
      ASSERT_EQ(got, expected) << call;
      ASSERT_EQ(read_flags(), (FlagWords{model.flags.overflow, kBefore, model.ns_flags.overflow,
                                         kBefore, kBefore, kBefore}));
      ++spoken[got];
      if (audio == kLoud) ++ns_raised[model.ns_flags.overflow];
      said_as_expected();
      if (one_in(200)) {
        model.reset();
        ASSERT_EQ(ResetEPDparams(epd.get()), 0);
        said_as_expected();
      }
      if (one_in(100)) {
        model.stop_logging();
        ASSERT_EQ(setLogging(epd.get(), 1), 0);
        said_as_expected();
      }
      if (HasFailure()) return;
      ASSERT_TRUE(snapshot(*epd) == snapshot(model.record)) << call;
    }
    epd.reset();
    ASSERT_EQ(log.take(), LogLines{debug_line("TQE: free EPD memory id : %ld", id)});
    if (dumps) {
      const std::string stem = folder / std::to_string(id);
      ASSERT_EQ(load_recording(stem + "_inputEPD.pcm"), model.dumped_input);
      ASSERT_EQ(load_recording(stem + "_resultEPD.pcm"), model.dumped_decisions);
      fs::remove(stem + "_inputEPD.pcm");
      fs::remove(stem + "_resultEPD.pcm");
    }
    ASSERT_TRUE(fs::is_empty(folder)) << "there were other files";
  }
  for (const int calls : {spoken[0], spoken[1], ns_raised[0], ns_raised[1]}) EXPECT_GT(calls, 300);
}

TEST_F(EpdDriver, RefusesWhatIsNotThere) {
  const Detector epd(InitializeEPD(0, 0));
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
  EXPECT_EQ(log.take(), LogLines{debug_line("TQE: free EPD memory id : %d", 0)});
  EXPECT_EQ(FreeMemoryEPD(reinterpret_cast<EpdInstance *>(std::intptr_t{-1})), -1);
  EXPECT_EQ(log.take(), LogLines{debug_line("TQE: free EPD memory id : %d", -1)});

  EXPECT_STREQ(GetVersion(), "160705");
  // What is left of 256 bytes beside folder, the longest handle and suffix.
  EXPECT_EQ(SetDumpRoot(std::string(200, 'x').c_str()), 0);
  EXPECT_EQ(SetDumpRoot(std::string(201, 'x').c_str()), -1);

  const auto no_memory = ScriptedMalloc::failing();
  EXPECT_EQ(InitializeEPD(21001, 1), nullptr);
  EXPECT_EQ(log.take(), LogLines{version_line(21001)});
}

TEST_F(EpdDriver, LeavesBothDumpFilesBehindEachCallAndNoHandle) {
  const fs::path folder = make_dump_folder();
  const auto before = open_files();
  {
    const Detector epd(InitializeEPD(0, 1));
    EXPECT_EQ(open_files(), before + 2);
    const fs::path input = folder / (std::to_string(number(epd.get())) + "_inputEPD.pcm");
    const fs::path result = folder / (std::to_string(number(epd.get())) + "_resultEPD.pcm");
    for (const Pcm &pcm : {Pcm{}, Pcm(160), kNormal, Pcm(300, 1000), Pcm{1}}) {
      fs::remove(input);
      fs::remove(result);
      process(epd, pcm);
      EXPECT_TRUE(fs::exists(input) && fs::exists(result)) << pcm.size();
      EXPECT_EQ(open_files(), before + 2) << pcm.size();
    }
    // Who can write to the folder cannot choose another file, nor does a child process inherit one.
    fs::remove(input);
    fs::create_symlink(root.path() / "victim", input);
    process(epd, kNormal);
    EXPECT_FALSE(fs::exists(root.path() / "victim"));
    for (const auto &file : fs::directory_iterator("/proc/self/fd")) {
      std::error_code closed;
      if (!fs::read_symlink(file, closed).string().ends_with("EPD.pcm")) continue;
      EXPECT_EQ(fcntl(std::stoi(file.path().filename()), F_GETFD), FD_CLOEXEC);
    }
  }
  EXPECT_EQ(open_files(), before);
}

TEST_F(EpdDriver, DoesWithoutDumpFiles) {
  SetDumpRoot(root.path().c_str());
  const Pcm speech = speech_16k("numbers.raw");
  const Pcm frames(speech.begin(), speech.begin() + std::ssize(speech) / 160 * 160);
  const auto before = open_files();
  const auto works = [&](Word32 dumps) {
    const Detector epd(InitializeEPD(0, dumps));
    EXPECT_EQ(process(epd, frames), 1);
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

TEST_F(EpdDriver, CountersStopAtTheirEnd) {
  const Detector epd(InitializeEPD(0, 0));
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
