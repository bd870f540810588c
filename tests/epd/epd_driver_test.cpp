// The EPD instance and its frame driver at their edges: refusals, dump files, counters.
#include <fcntl.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <cstdint>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <memory>
#include <string>

#include "Voice_Engine/epd/epd_instance.h"
#include "orvalis.h"
#include "tests/support/quiet_log.h"
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

long number(const EpdInstance *epd) { return reinterpret_cast<std::intptr_t>(epd); }

int32_t process(const Detector &epd, const Pcm &pcm) {
  return ProcessEPDFrame(epd.get(), pcm.data(), static_cast<int32_t>(pcm.size()));
}

std::ptrdiff_t open_files() {
  return std::distance(fs::directory_iterator("/proc/self/fd"), fs::directory_iterator());
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

  const QuietLog quiet;
  const TemporaryFolder root;
};

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
  EXPECT_EQ(FreeMemoryEPD(nullptr), -1);
  EXPECT_EQ(FreeMemoryEPD(reinterpret_cast<EpdInstance *>(std::intptr_t{-1})), -1);

  EXPECT_STREQ(GetVersion(), "160705");
  // What is left of 256 bytes beside folder, the longest handle and suffix.
  EXPECT_EQ(SetDumpRoot(std::string(200, 'x').c_str()), 0);
  EXPECT_EQ(SetDumpRoot(std::string(201, 'x').c_str()), -1);

  const auto no_memory = ScriptedMalloc::failing();
  EXPECT_EQ(InitializeEPD(21001, 1), nullptr);
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

TEST_F(EpdDriver, TakesItsModeApart) {
  const struct {
    Word32 mode, sub_mode, rate, gain;
  } cases[] = {{4, 0, 0, 0},
               {3, 3, 0, 0},
               {-3, 0, 0, 0},
               {9002, 2, 0, 0},
               {-11001, 0, -1, -1},
               {21001, 1, 1, 2},
               {INT32_MAX, 0, 0, 214748},
               {INT32_MIN, 0, -3, -214748}};
  for (const auto &[mode, sub_mode, rate, gain] : cases) {
    const Detector epd(InitializeEPD(mode, 0));
    EXPECT_EQ(epd->epdMode, sub_mode) << mode;
    EXPECT_EQ(epd->rateMode, rate) << mode;
    EXPECT_EQ(epd->inputGainMode, gain) << mode;
  }
}

TEST_F(EpdDriver, AudioIsAbnormalFrom120SmallSamples) {
  for (const std::int16_t level : {-5, -4, 4, 5}) {
    for (const int small : {119, 120}) {
      const Detector epd(InitializeEPD(0, 0));
      Pcm frame = kNormal;
      std::fill_n(frame.begin(), small, level);
      process(epd, frame);
      EXPECT_EQ(epd->abnormalCheckCount, small == 120 && std::abs(level) == 4 ? 0 : 3) << level;
    }
  }
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
