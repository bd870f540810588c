// Instances on threads of their own, with one log sink, give the same results as alone.
#include <gtest/gtest.h>

#include <atomic>
#include <numeric>
#include <thread>
#include <vector>

#include "jni/orvalis.h"
#include "stream/utterance_stream.h"
#include "tests/support/recordings.h"

namespace orvalis::test {
namespace {

std::vector<int64_t> answers_of(const Pcm &pcm) {
  std::vector<int64_t> results;
  EpdInstance *epd = InitializeEPD(0, 0);
  for (std::size_t at = 0; at + 160 <= pcm.size(); at += 160) {
    results.push_back(ProcessEPDFrame(epd, &pcm[at], 160));
  }
  FreeMemoryEPD(epd);

  // One microphone: two share a state in the process.
  NsInstance *ns = InitializeDoNS(2, 1, 0);
  const int64_t drc = InitializeDRC(16000, 0);
  Pcm suppressed = pcm, scratch = pcm;
  for (std::size_t at = 0; at + 160 <= pcm.size(); at += 160) {
    results.push_back(ProcessDoNSFrame(ns, &scratch[at], 160, &suppressed[at], 160));
    results.push_back(ProcessDRC(drc, &suppressed[at], 160));
  }
  FreeMemoryNS(ns);
  FreeMemoryDRC(drc);
  results.insert(results.end(), suppressed.begin(), suppressed.end());

  const UtteranceSettings settings = UTTERANCE_SETTINGS_DEFAULT;
  UtteranceStream *stream = OpenUtteranceStream(&settings);
  PushUtteranceAudio(stream, pcm.data(), static_cast<int32_t>(pcm.size()));
  FlushUtteranceStream(stream);
  for (Utterance found; NextUtterance(stream, &found) == 1;) {
    results.insert(results.end(), {found.start, found.end, found.number});
  }
  CloseUtteranceStream(stream);
  return results;
}

TEST(Threads, InstancesDoNotDisturbEachOther) {
  std::atomic<int> lines = 0;
  SetLogSink([](int, const char *, const char *,
                void *count) { static_cast<std::atomic<int> *>(count)->fetch_add(1); },
             &lines);
  constexpr int kThreads = 16;
  std::vector<Pcm> recordings;
  std::vector<std::vector<int64_t>> alone, together(kThreads);
  for (const char *name : kSentences) {
    recordings.push_back(speech_16k(name));
    alone.push_back(answers_of(recordings.back()));
  }
  const int lines_alone = lines.exchange(0);

  std::vector<std::thread> threads;
  for (int i = 0; i < kThreads; ++i) {
    threads.emplace_back([&, i] { together[i] = answers_of(recordings[i % recordings.size()]); });
  }
  for (std::thread &thread : threads) thread.join();
  for (int i = 0; i < kThreads; ++i) EXPECT_EQ(together[i], alone[i % alone.size()]) << i;
  EXPECT_GT(lines, 3 * lines_alone) << "every thread reaches the sink";
  SetLogSink(nullptr, nullptr);
}

}  // namespace
}  // namespace orvalis::test
