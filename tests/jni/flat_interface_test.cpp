// The flat interface as a host meets it: what it refuses, where log lines and dump files go, and
// that instances on threads of their own do not disturb each other.
#include <fcntl.h>
#include <gtest/gtest.h>

#include <atomic>
#include <filesystem>
#include <fstream>
#include <string>
#include <thread>

#include "Voice_Engine/epd/epd_instance.h"
#include "Voice_Engine/ns/s2chns.h"
#include "Voice_Engine/platform/log.h"
#include "stream/utterance_stream.h"
#include "tests/support/quiet_log.h"
#include "tests/support/recordings.h"
#include "tests/support/scripted_malloc.h"
#include "tests/support/temporary_folder.h"

namespace orvalis::test {
namespace {

namespace fs = std::filesystem;

void expect_all(std::int32_t expected, std::initializer_list<std::int32_t> answers) {
  EXPECT_EQ(std::vector(answers), std::vector(answers.size(), expected));
}

TEST(FlatInterface, RefusesWhatIsDocumented) {
  const QuietLog quiet;
  EpdInstance *const epd = InitializeEPD(0, 0), *const no_epd = nullptr;
  NsInstance *const ns = InitializeDoNS(0, 1, 0), *const narrow = InitializeDoNS(1000, 1, 0);
  NsInstance *const two = InitializeDoNS(1000, 2, 0), *const no_ns = nullptr;
  auto *const not_epd = reinterpret_cast<EpdInstance *>(std::intptr_t(-1));
  auto *const not_ns = reinterpret_cast<NsInstance *>(std::intptr_t(-1));
  const std::int64_t drc = InitializeDRC(16000, 0), slow = InitializeDRC(8000, 0);
  Pcm pcm(640, 1000), out = pcm;
  std::int16_t *const x = pcm.data(), *const y = out.data(), *const none = nullptr;
  std::int32_t *const no_bins = nullptr;
  const std::string longest(200, 'x'), longer = longest + 'x';
  expect_all(-1,
             {ProcessEPDFrame(no_epd, x, 160), ProcessEPDFrame(no_epd, none, 0),
              ProcessEPDFrame(epd, none, 1), ProcessEPDFrameByCnttype(no_epd, x, 160, 0),
              ProcessEPDFrameByCnttype(epd, none, 160, 0), ProcessEPDFrameByMode(no_epd, x, 160, 0),
              ProcessEPDFrameByMode(epd, none, 160, 0),
              ProcessEPDFrameExplained(no_epd, x, 160, 0, nullptr), ResetEPDparams(no_epd),
              setLogging(no_epd, 1), FreeMemoryEPD(no_epd), FreeMemoryEPD(not_epd)});
  expect_all(-1, {ProcessDoNSFrame(no_ns, x, 160, y, 160), ProcessDoNSFrame(ns, none, 160, y, 160),
                  ProcessDoNSFrame(ns, x, 160, none, 160), ProcessDoNSFrame(two, x, 320, y, 640),
                  ProcessDoNSFrame(narrow, x, 80, y, 80), ProcessDoNSFrame(narrow, x, 0, y, 0),
                  FreeMemoryNS(no_ns), FreeMemoryNS(not_ns)});
  expect_all(-1, {ProcessDRC(0, x, 160), ProcessDRC(-1, x, 160), ProcessDRC(drc, none, 1),
                  FreeMemoryDRC(0), FreeMemoryDRC(-1), SetDumpRoot(longer.c_str())});
  expect_all(
      0,
      {ProcessEPDFrameByMode(epd, none, 0, 0), ProcessDRC(drc, none, 0), ProcessDRC(slow, x, 160),
       computeEnergy(none, 320), computeEnergy(x, 0), ComputeEnergy(none, 320, 16000),
       ComputeEnergy(x, -1, 16000), ComputeEnergy(x, 320, 49), getSpectrum(none, no_bins, 16000),
       getSpectrum(x, no_bins, 16000), SetDumpRoot(longest.c_str()), SetDumpRoot(nullptr)});
  const auto pair = std::make_unique<S2chnsState>();
  for (const Word16 n : {1, 159, 161}) EXPECT_EQ(S2CHNSProcessNSFrame(*pair, x, y, n), -100);
  EXPECT_EQ(pcm, Pcm(640, 1000));
  EXPECT_EQ(out, pcm);
  EXPECT_STREQ(GetVersion(), "160705");
  expect_all(0, {FreeMemoryEPD(epd), FreeMemoryNS(ns), FreeMemoryNS(narrow), FreeMemoryNS(two),
                 FreeMemoryDRC(drc), FreeMemoryDRC(slow)});
  const auto no_memory = ScriptedMalloc::failing();
  EXPECT_EQ(InitializeEPD(21001, 1), nullptr);
  EXPECT_EQ(InitializeDoNS(2, 2, 0), nullptr);
  EXPECT_EQ(InitializeDRC(16000, 1), -1);
}

TEST(FlatInterface, KeepsDumpFilesToTheirFolder) {
  const QuietLog quiet;
  const TemporaryFolder root;
  SetDumpRoot(root.path().c_str());
  const auto process = [](EpdInstance *epd) { ProcessEPDFrame(epd, Pcm(160, 1000).data(), 160); };
  EpdInstance *epd = nullptr;
  // Where a file stands in the folder's place, it works without dumps; and only 1 asks for them.
  std::ofstream(root / "sdcard") << "a file";
  for (const int dumps : {1, 0, 2, -1}) {
    epd = InitializeEPD(0, dumps);
    process(epd);
    FreeMemoryEPD(epd);
    if (dumps == 1) fs::remove(root / "sdcard");
    fs::create_directories(root / "sdcard/VRpreprocess");
  }
  EXPECT_TRUE(fs::is_empty(root / "sdcard/VRpreprocess"));

  epd = InitializeEPD(0, 1);
  const std::string base =
      root / ("sdcard/VRpreprocess/" + std::to_string(reinterpret_cast<std::intptr_t>(epd)));
  const std::string input = base + "_inputEPD.pcm", result = base + "_resultEPD.pcm";
  for (int i = 0; i < 2; ++i) {
    process(epd);
    EXPECT_TRUE(fs::remove(input) && fs::remove(result)) << "there after each call";
  }
  // Who can write to the folder cannot choose another file, nor does a child process inherit one.
  fs::create_symlink(root / "victim", input);
  process(epd);
  EXPECT_FALSE(fs::exists(root / "victim"));
  for (const auto &file : fs::directory_iterator("/proc/self/fd")) {
    std::error_code closed;
    if (fs::read_symlink(file, closed).string().find("EPD.pcm") == std::string::npos) continue;
    EXPECT_EQ(fcntl(std::stoi(file.path().filename()), F_GETFD), FD_CLOEXEC);
  }
  FreeMemoryEPD(epd);
  SetDumpRoot(nullptr);
}

TEST(FlatInterface, LogsToTheSinkAndWithoutOneProblemsToStandardError) {
  const auto lines_of = [](const std::string &text) {
    testing::internal::CaptureStderr();
    log_line(kLogDebug, kLogTag, "%s", text.c_str());
    log_line(kLogInfo, kLogTag, "%d", 4);
    log_line(kLogWarning, kLogTag, "%d", 5);
    log_line(kLogError, kLogTag, "six");
    return testing::internal::GetCapturedStderr();
  };
  SetLogSink(LogNothing, nullptr);
  EXPECT_EQ(lines_of("one"), "");
  SetLogSink(LogAllToStandardError, nullptr);
  EXPECT_EQ(lines_of("one"), "D/Orvalis: one\nI/Orvalis: 4\nW/Orvalis: 5\nE/Orvalis: six\n");
  EXPECT_EQ(lines_of(std::string(1000, 'x')).find('\n'), std::string("D/Orvalis: ").size() + 255)
      << "truncated, not lost";
  std::string received;
  SetLogSink(
      [](int priority, const char *tag, const char *text, void *user) {
        *static_cast<std::string *>(user) += std::to_string(priority) + tag + text + ";";
      },
      &received);
  EXPECT_EQ(lines_of("one"), "");
  EXPECT_EQ(received, "3Orvalisone;4Orvalis4;5Orvalis5;6Orvalissix;");
  SetLogSink(nullptr, nullptr);
  EXPECT_EQ(lines_of("one"), "W/Orvalis: 5\nE/Orvalis: six\n");
}

std::vector<std::int64_t> answers_of(const Pcm &pcm) {
  std::vector<std::int64_t> answers;
  EpdInstance *epd = InitializeEPD(0, 0);
  NsInstance *ns = InitializeDoNS(2, 1, 0);  // one microphone: two share a state in the process
  const std::int64_t drc = InitializeDRC(16000, 0);
  Pcm out = pcm, scratch = pcm;
  for (std::size_t at = 0; at + 160 <= pcm.size(); at += 160) {
    answers.push_back(ProcessEPDFrame(epd, &pcm[at], 160));
    answers.push_back(ProcessDoNSFrame(ns, &scratch[at], 160, &out[at], 160));
    answers.push_back(ProcessDRC(drc, &out[at], 160));
  }
  FreeMemoryEPD(epd);
  FreeMemoryNS(ns);
  FreeMemoryDRC(drc);
  answers.insert(answers.end(), out.begin(), out.end());
  const UtteranceSettings settings = UTTERANCE_SETTINGS_DEFAULT;
  UtteranceStream *stream = OpenUtteranceStream(&settings);
  PushUtteranceAudio(stream, pcm.data(), static_cast<std::int32_t>(pcm.size()));
  FlushUtteranceStream(stream);
  for (Utterance found; NextUtterance(stream, &found) == 1;)
    answers.insert(answers.end(), {found.start, found.end, found.number});
  CloseUtteranceStream(stream);
  return answers;
}

TEST(FlatInterface, ThreadsDoNotDisturbEachOther) {
  std::atomic<int> lines = 0;
  SetLogSink([](int, const char *, const char *,
                void *count) { static_cast<std::atomic<int> *>(count)->fetch_add(1); },
             &lines);
  constexpr std::size_t kThreads = 16, kSpoken = std::size(kSentences);
  std::vector<std::vector<std::int64_t>> alone, together(kThreads);
  for (const char *name : kSentences) alone.push_back(answers_of(speech_16k(name)));
  const int lines_alone = lines.exchange(0);
  std::vector<std::thread> threads;
  for (std::size_t i = 0; i < kThreads; ++i)
    threads.emplace_back([&, i] { together[i] = answers_of(speech_16k(kSentences[i % kSpoken])); });
  for (std::thread &thread : threads) thread.join();
  for (std::size_t i = 0; i < kThreads; ++i) EXPECT_EQ(together[i], alone[i % kSpoken]) << i;
  EXPECT_GT(lines, 3 * lines_alone) << "every thread reaches the sink";
  SetLogSink(nullptr, nullptr);
}

}  // namespace
}  // namespace orvalis::test
