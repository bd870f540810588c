// The NS instance and its frame driver at their edges: settling, refusals, counts.
#include <gtest/gtest.h>

#include <algorithm>
#include <cstdint>
#include <memory>
#include <string>
#include <utility>

#include "Voice_Engine/ns/ns_instance.h"
#include "orvalis.h"
#include "tests/support/quiet_log.h"
#include "tests/support/recordings.h"
#include "tests/support/scripted_malloc.h"

namespace orvalis::test {
namespace {

constexpr int kTail = 480;  // a partial frame, and what the suppressor takes beyond a short one

struct FreeSuppressor {
  void operator()(NsInstance *ns) const { EXPECT_EQ(FreeMemoryNS(ns), 0); }
};
using Suppressor = std::unique_ptr<NsInstance, FreeSuppressor>;

struct NsDriver : testing::Test {
  const QuietLog quiet;
};

TEST_F(NsDriver, SettlesByTheFirstFrameByThreeOrByTime) {
  // Frames: normal, hissing (three quarters of small samples), barely normal, of zeros; what
  // follows shows which are suppressed.
  const std::pair<std::string, std::string> cases[] = {
      {"nhz", "ww."},     {"bh", "ww"},         {"hnnnnh", "....ww"},
      {"znnbn", "....w"}, {"hnznnn", ".....w"}, {"hnnhnnnn", ".......w"}};
  for (const Word32 rate : {0, 2, 3}) {
    for (const Word32 mics : {1, 2, 3}) {
      const int length = mics == 2 || rate == 2 ? 320 : rate == 0 ? 160 : 80;
      const auto suppressed = [&](const std::string &frames) {
        const Suppressor ns(InitializeDoNS(1000 * rate, mics, 0));
        std::string written;
        Word32 processed = 0;
        for (const char kind : frames) {
          Pcm in(length + kTail, static_cast<Word16>(kind == 'z' ? 0 : 1000));
          if (kind == 'h' || kind == 'b') std::fill_n(in.begin(), length * 3 / 4, Word16{-4});
          if (kind == 'b') in[0] = 5;
          Pcm out(in.size(), 12345);
          processed += length;
          EXPECT_EQ(ProcessDoNSFrame(ns.get(), in.data(), length, out.data(), length), processed);
          written += out == Pcm(in.size(), 12345) ? '.' : 'w';
        }
        return written;
      };
      const auto expected = [&](const std::string &written) {
        return mics == 3 ? std::string(written.size(), '.') : written;
      };
      for (const auto &[frames, written] : cases)
        EXPECT_EQ(suppressed(frames), expected(written)) << frames << length;
      const int in_time = 3200 / length;  // frames
      EXPECT_EQ(suppressed(std::string(in_time + 1, 'h')),
                expected(std::string(in_time - 1, '.') + "ww"));
    }
  }
}

TEST_F(NsDriver, RefusesWhatIsNotThere) {
  Pcm in(160 + kTail, 1000), out = in;
  const Suppressor one(InitializeDoNS(0, 1, 0)), two(InitializeDoNS(1000, 2, 0));
  const Suppressor narrow(InitializeDoNS(1000, 1, 0)), none(InitializeDoNS(1000, 3, 0));
  EXPECT_EQ(ProcessDoNSFrame(nullptr, in.data(), 160, out.data(), 160), -1);
  for (const Suppressor *ns : {&one, &two}) {
    for (const int count : {0, 159, 320, -160})
      EXPECT_EQ(ProcessDoNSFrame(ns->get(), in.data(), 160, out.data(), count), -1) << count;
    EXPECT_EQ(ProcessDoNSFrame(ns->get(), nullptr, 320, out.data(), 320), -1);
    EXPECT_EQ(ProcessDoNSFrame(ns->get(), in.data(), 320, nullptr, 320), -1);
  }
  for (const Suppressor *ns : {&narrow, &none})
    for (const int count : {80, 160, 0, -1})
      EXPECT_EQ(ProcessDoNSFrame(ns->get(), in.data(), count, out.data(), count), -1) << count;
  EXPECT_EQ(out, Pcm(out.size(), 1000));

  EXPECT_EQ(FreeMemoryNS(nullptr), -1);
  EXPECT_EQ(FreeMemoryNS(reinterpret_cast<NsInstance *>(std::intptr_t{-1})), -1);
  const auto no_memory = ScriptedMalloc::failing();
  for (const Word32 mics : {1, 2, 3}) EXPECT_EQ(InitializeDoNS(2, mics, 0), nullptr);
}

TEST_F(NsDriver, CountsAsFarAsItCan) {
  Pcm in(160, 1000), out = in;
  const Suppressor ns(InitializeDoNS(0, 1, 0));
  ns->processedSamples = INT32_MAX - 200;
  for (const Word32 expected : {INT32_MAX - 40, INT32_MAX, INT32_MAX})
    EXPECT_EQ(ProcessDoNSFrame(ns.get(), in.data(), 160, out.data(), 160), expected);
}

}  // namespace
}  // namespace orvalis::test
