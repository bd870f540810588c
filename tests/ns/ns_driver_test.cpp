// The NS instance and its frame driver, seen through buffers, counts, log lines and flags.
#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <memory>
#include <string>
#include <utility>

#include "Voice_Engine/ns/ns_instance.h"
#include "Voice_Engine/ns/s2chns.h"
#include "orvalis.h"
#include "tests/support/flag_words.h"
#include "tests/support/log_capture.h"
#include "tests/support/random.h"
#include "tests/support/recordings.h"
#include "tests/support/scripted_malloc.h"

namespace orvalis::test {
namespace {

constexpr FlagWords kUntouched = {7, 7, 7, 7, 7, 7};  // no operator writes a 7
constexpr int kTail = 480;  // a partial frame, and what the suppressor takes beyond a short one

struct FreeSuppressor {
  void operator()(NsInstance *ns) const { EXPECT_EQ(FreeMemoryNS(ns), 0); }
};
using Suppressor = std::unique_ptr<NsInstance, FreeSuppressor>;

LogLine version_line(Word32 argument) {
  return debug_line("TQE: libOrvalis.so version 160705 IS127 in doNS, NS MODE : %d", argument);
}

struct Mode {
  Word32 mode, rate;
  Word16 argument;  // what the single-microphone suppressor is prepared with
};
constexpr Mode kModes[] = {{0, 0, 0},      {2, 0, 2},     {10002, 0, 2},     {12, 0, 0},
                           {-2, 0, 0},     {1000, 1, 0},  {1002, 1, 2},      {2000, 2, 0},
                           {2002, 2, 2},   {3002, 3, 2},  {9000, 9, 0},      {-1000, -1, 0},
                           {-2002, -2, 0}, {12002, 2, 2}, {INT32_MAX, 3, 0}, {INT32_MIN, -3, 0}};
constexpr Word32 kMicCounts[] = {1, 2, 0, 3, -1};

/// Samples a frame; 0 where every frame is refused.
int frame_length(Word32 mics, Word32 rate) {
  if (mics == 2 || rate == 2) return 320;
  return rate == 0 ? 160 : rate == 1 ? 0 : 80;
}

/// The driver a second time, as the list of its steps on the engine's suppressors.
struct Model {
  Model(const Mode &mode, Word32 mic_count, S2chnsState &shared)
      : mics(mic_count), length(frame_length(mics, mode.rate)), both(shared) {
    if (mics == 1) lines.push_back(debug_line("TQE: DoNS_Create 1Mic NS Initialize"));
    if (mics == 2) lines.push_back(debug_line("TQE: DoNS_Create 2Mic NS Initialize"));
    lines.push_back(version_line(mode.argument));
    S1CHNSInit(&single, mode.argument);
    if (mics == 2) both = {};
  }

  Word32 process(Word16 *in, Word32 samples, Word16 *out) {
    if (length == 0) return -1;
    if (samples % length != 0) {
      lines.push_back(debug_line("TQE: Check pcm buffer size : numInSample = %d, PCM_LEN = %d",
                                 samples, length));
      lines.back().priority = 6;
    }
    if (processed == 0)
      lines.push_back(debug_line("TQE: with DoNS ... numInSample = %d ", samples));
    int small = 0;
    for (Word32 at = 0; at < samples; at += length) {
      processed += length;
      if (is_null(in + at, small)) {
        lines.push_back(debug_line("TQE: Audio Null Check fail ... dont do NS !"));
      } else if (is_settled(4 * small < 3 * length)) {
        calm = 3;
        if (mics == 1) s1chns_C(flags, &single, in + at, out + at);
        if (mics == 2) S2CHNSProcessNSFrame(both, in + at, out + at, 160);
      }
    }
    return processed;
  }

  bool is_null(const Word16 *frame, int &small) const {
    int zeros = 0;
    for (int i = 0; i < length; ++i) {
      zeros = frame[i] == 0 ? zeros + 1 : 0;
      if (zeros == 61) return true;
      small += frame[i] != 0 && std::abs(frame[i]) <= 4;
    }
    return false;
  }

  bool is_settled(bool normal) {
    const bool first = processed == length;
    if (calm == 3 || (first ? normal : processed >= 3200)) return true;
    const bool counts = normal && !first;
    calm = counts ? calm + 1 : 0;
    lines.push_back(debug_line("TQE: Check Abnormal Audio ...%s dont do NS ... in DoNS_Proc_Frame",
                               counts ? " wait few more frame ..." : ""));
    return false;
  }

  const Word32 mics;
  const int length;
  S2chnsState &both;  ///< of all instances with two microphones
  S1chnsState single{};
  Flags flags;
  Word32 processed = 0;
  int calm = 0;
  LogLines lines;
};

struct NsDriver : testing::Test {
  LogCapture log;
};

TEST_F(NsDriver, FollowsItsSteps) {
  auto random = seeded_generator();
  const auto one_of = [&](const auto &values) { return values[random() % std::size(values)]; };
  const auto one_in = [&](int cases) { return random() % cases == 0; };
  const auto both = std::make_unique<S2chnsState>();
  std::array<int, 2> changed{};
  for (int sequence = 0; sequence < 150; ++sequence) {
    SCOPED_TRACE(sequence);
    const Mode &mode = one_of(kModes);
    const Word32 mics = one_in(3) ? one_of(kMicCounts) : 1 + static_cast<Word32>(random() % 2);
    const auto create = [&] {
      return Suppressor(InitializeDoNS(mode.mode, mics, static_cast<int32_t>(random())));
    };
    Suppressor ns = create();
    Model model(mode, mics, *both);
    const int length = std::max(80, model.length);
    const bool hesitant = one_in(2);  // around the limits of screening
    for (int call = 0; call < 60; ++call) {
      const int frames = one_in(20) ? 0 : one_in(4) ? 3 : 1;
      const int partial = one_in(20) ? static_cast<int>(random() % length) : 0;
      Pcm in(frames * length + partial + kTail);
      const int small = one_of(std::array{0, 1, 2, 3, 4}) * length / 4 - one_of(std::array{0, 1});
      for (int i = 0; i < std::ssize(in); ++i)
        in[i] = static_cast<Word16>(hesitant && i % length < small ? one_of(std::array{-4, -1, 4})
                                                                   : random() | 5);
      if (one_in(10))
        std::fill_n(&in[random() % (in.size() - 61)], one_of(std::array{60, 61}), Word16{0});
      const Word32 samples = one_in(50) ? -160 : frames * length + partial;
      const bool in_place = one_in(4);
      Pcm out(in.size(), 12345), expected_in = in, expected_out = out;

      model.flags.overflow = model.flags.carry = 7;
      const Word32 expected = model.process(expected_in.data(), samples,
                                            in_place ? expected_in.data() : expected_out.data());
      write_flags(kUntouched);
      const Word32 got = ProcessDoNSFrame(ns.get(), in.data(), samples,
                                          in_place ? in.data() : out.data(), samples);
      ASSERT_EQ(got, expected) << call;
      ASSERT_EQ(read_flags(), (FlagWords{7, 7, model.flags.overflow, model.flags.carry, 7, 7}));
      ASSERT_EQ(log.take(), std::exchange(model.lines, {})) << call;
      ASSERT_EQ(in, expected_in) << call;
      ASSERT_EQ(out, expected_out) << call;
      ++changed[in_place ? 0 : out != Pcm(out.size(), 12345)];
      if (mics == 2 && one_in(60)) {
        *both = {};
        create();  // resets the suppressor that all share
        log.take();
      }
    }
    const long id = reinterpret_cast<std::intptr_t>(ns.get());
    ns.reset();
    ASSERT_EQ(log.take(), LogLines{debug_line("TQE: free NS memory id : %li", id)});
  }
  EXPECT_GT(changed[1], 1000);
}

TEST_F(NsDriver, SettlesByTheFirstFrameByThreeOrByTime) {
  // Frames: normal, hissing (three quarters of small samples), barely normal, of zeros; what
  // follows shows which are suppressed.
  const std::pair<std::string, std::string> cases[] = {
      {"nhz", "ww."},     {"bh", "ww"},         {"hnnnnh", "....ww"},
      {"znnbn", "....w"}, {"hnznnn", ".....w"}, {"hnnhnnnn", ".......w"}};
  for (const Mode &mode : {Mode{2, 0, 2}, Mode{2000, 2, 0}, Mode{3000, 3, 0}}) {
    for (const Word32 mics : {1, 2, 3}) {
      const int length = frame_length(mics, mode.rate);
      const auto suppressed = [&](const std::string &frames) {
        const Suppressor ns(InitializeDoNS(mode.mode, mics, 0));
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
  log.take();
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
  EXPECT_EQ(log.take(), LogLines{});
  EXPECT_EQ(out, Pcm(out.size(), 1000));

  EXPECT_EQ(FreeMemoryNS(nullptr), -1);
  EXPECT_EQ(FreeMemoryNS(reinterpret_cast<NsInstance *>(std::intptr_t{-1})), -1);
  EXPECT_EQ(log.take(), (LogLines{debug_line("TQE: free NS memory id : 0"),
                                  debug_line("TQE: free NS memory id : -1")}));
  const auto no_memory = ScriptedMalloc::failing();
  for (const Word32 mics : {1, 2, 3}) EXPECT_EQ(InitializeDoNS(2, mics, 0), nullptr);
  EXPECT_EQ(log.take(), (LogLines{version_line(0), version_line(0), version_line(0)}));
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
