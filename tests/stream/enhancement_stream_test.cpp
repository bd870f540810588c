// What the enhancement stream makes of audio, and what holds for any audio: ends, delays,
// several streams. That nothing depends on the cut is for the fuzz target. Linked with --wrap for
// malloc.
#include "stream/enhancement_stream.h"

#include <gtest/gtest.h>
#include <malloc.h>

#include <algorithm>
#include <array>
#include <cmath>
#include <memory>
#include <random>
#include <thread>
#include <vector>

#include "jni/orvalis.h"
#include "tests/support/fold.h"
#include "tests/support/noise.h"
#include "tests/support/scripted_malloc.h"

namespace orvalis::test {
namespace {

using Settings = EnhancementSettings;

struct StreamCloser {
  void operator()(EnhancementStream *stream) const { EXPECT_EQ(CloseEnhancementStream(stream), 0); }
};
using Stream = std::unique_ptr<EnhancementStream, StreamCloser>;
Stream open(const Settings &settings) { return Stream(OpenEnhancementStream(&settings)); }

Pcm part(const Pcm &samples, std::ptrdiff_t from, std::ptrdiff_t count) {
  return {samples.begin() + from, samples.begin() + from + count};
}

/// Appends what comes out, without or with a flush.
void push(const Stream &stream, const Pcm &in, Pcm &out, bool flushed = false) {
  Pcm room(in.size() + 2 * ENHANCEMENT_HELD_BACK);
  const auto size = static_cast<int32_t>(room.size());
  int32_t ready = PushEnhancementAudio(stream.get(), in.data(), static_cast<int32_t>(in.size()),
                                       room.data(), size);
  if (flushed) ready += FlushEnhancementStream(stream.get(), &room[ready], size - ready);
  out.insert(out.end(), room.begin(), room.begin() + ready);
}

Pcm enhanced(const Settings &settings, const Pcm &in) {
  Pcm out;
  push(open(settings), in, out, true);
  return out;
}

/// Hiss that does not settle, speech in noise, silence and full scale, the same on every processor.
Pcm audio(int microphones, unsigned seed = 1) {
  std::mt19937 noise(seed);
  Pcm samples;
  int i = 0;
  for (const int speech : speech_16k("goforward.raw")) {
    for (int c = 0; c < microphones; ++c) {
      int sample = i < 1200 ? (i % 2 ? 3 : -2) : 2 * speech / (c + 1) + int(noise() % 501) - 250;
      if (i / 1500 == 9) sample = 0;
      if (i / 1500 == 12) sample = i % 64 < 32 ? 32767 : -32768;
      samples.push_back(to_sample(sample));
    }
    ++i;
  }
  samples.resize(samples.size() / 320 * 320);
  return samples;
}

/// What comes out under all settings that matter, as digests.
TEST(EnhancementStream, SuppressesAndLevelsWithTheDelayedInputWhereItIsSilent) {
  const struct {
    Settings settings;
    int delay;
    std::uint64_t digest;
  } kCases[] = {{{1, 13, 0, 0}, 48, 0xfa99b830c2863fdf},  {{1, 18, 0, 0}, 48, 0x5cad3265d1b4dab2},
                {{2, 13, 0, 0}, 160, 0xb69808c5084c514d}, {{2, 0, 0, 0}, 0, 0xf4d04df9c12cd3be},
                {{1, 0, 1, 1}, 0, 0xc3a3fa309ab6c974},    {{2, 13, 1, 1}, 160, 0xd3587513d9501b76}};
  for (const auto &[settings, delay, digest] : kCases) {
    SCOPED_TRACE(testing::Message() << settings.microphones << ", " << settings.suppression_db);
    EXPECT_EQ(EnhancementDelay(open(settings).get()), delay);
    EXPECT_EQ(fold(enhanced(settings, audio(settings.microphones))), digest);
  }
}

TEST(EnhancementStream, KeepsLengthAndDelayAndMirrorsTheEnd) {
  for (const auto &[microphones, db] : {std::pair{1, 0}, {1, 13}, {1, 18}, {2, 0}, {2, 13}}) {
    for (const int n : {0, 1, 7, 47, 48, 112, 159, 160, 161, 319, 321, 479, 481, 5000}) {
      SCOPED_TRACE(testing::Message() << microphones << ", " << db << " dB, " << n);
      const Pcm in = part(audio(microphones), 8000 * microphones, n * microphones);
      const Pcm out = enhanced({microphones, db, 0, 1}, in);
      ASSERT_EQ(std::ssize(out), n);
      EXPECT_EQ(enhanced({microphones, db, 1, 1}, in), enhanced({1, 0, 1, 1}, out));
      for (const int level : {0, 1}) {
        Pcm late = enhanced({microphones, db, level, 0}, in);
        if (n > 0) late.erase(late.begin(), late.begin() + (db ? microphones == 2 ? 160 : 48 : 0));
        EXPECT_EQ(late, enhanced({microphones, db, level, 1}, in));
      }
      // The end is as if the audio went on backwards, forwards and so on.
      Pcm mirrored = in;
      for (int i = 0; n > 0 && i < 500; ++i) {
        const int at = i / n % 2 ? i % n : n - 1 - i % n;
        for (int c = 0; c < microphones; ++c) mirrored.push_back(in[at * microphones + c]);
      }
      EXPECT_EQ(out, part(enhanced({microphones, db, 0, 1}, mirrored), 0, n));
    }
  }
}

TEST(EnhancementStream, CountsWhatIsLoudAndClipped) {
  // A second of a tone that is not loud, then half a second of one that is and clips.
  Pcm tone, pairs, out;
  for (int i = 0; i < 24000; ++i)
    tone.push_back(to_sample((i < 16050 ? 2000 : 40000) * std::sin(i * 0.1)));
  for (const std::int16_t sample : tone) pairs.insert(pairs.end(), 2, sample);
  const Stream stream = open({2, 0, 1, 1});
  const auto expect = [&](const std::array<std::int64_t, 7> &expected) {
    EnhancementCounts c;
    EXPECT_EQ(GetEnhancementCounts(stream.get(), &c), 0);
    EXPECT_EQ(
        (std::array{c.clipped_in.count, c.clipped_in.first, c.loud_frames.count,
                    c.loud_frames.first, c.clipped_out.count, c.clipped_out.first, c.is_loud}),
        expected);
  };
  const auto is_clipped = [](int x) { return x == 32767 || x == -32768; };
  const auto clipped = [&](const Pcm &x) { return std::ranges::count_if(x, is_clipped); };
  const auto first = [&](const Pcm &x) { return std::ranges::find_if(x, is_clipped) - x.begin(); };
  expect({0, -1, 0, -1, 0, -1, 0});
  push(stream, pairs, out);
  expect({2 * clipped(tone), first(tone), 50, 16000, clipped(out), first(out), 1});
  push(stream, Pcm(3520), out);
  expect({2 * clipped(tone), first(tone), 59, 16000, clipped(out), first(out), 0});
}

TEST(EnhancementStream, RefusesBadArguments) {
  EXPECT_EQ(OpenEnhancementStream(nullptr), nullptr);
  const int refused[][4] = {{0, 0, 0, 1},  {3, 13, 0, 1},  {-1, 18, 0, 1},
                            {1, 14, 0, 1}, {2, 18, 0, 1},  {1, -13, 0, 1},
                            {1, 13, 2, 1}, {1, 13, -1, 1}, {1, 13, 0, 2}};
  for (const auto &[microphones, db, level, aligned] : refused)
    EXPECT_EQ(open({microphones, db, level, aligned}), nullptr) << microphones << ", " << db;
  EnhancementCounts counts;
  EXPECT_EQ(EnhancementDelay(nullptr), -1);
  EXPECT_EQ(PushEnhancementAudio(nullptr, nullptr, 0, nullptr, 0), -1);
  EXPECT_EQ(FlushEnhancementStream(nullptr, nullptr, 0), -1);
  EXPECT_EQ(GetEnhancementCounts(nullptr, &counts), -1);
  EXPECT_EQ(CloseEnhancementStream(nullptr), -1);

  std::int16_t out[ENHANCEMENT_HELD_BACK], *const none = nullptr;
  const Pcm frame(160, 1000);
  Stream stream = open(ENHANCEMENT_SETTINGS_DEFAULT);
  const auto push = [&](const std::int16_t *pcm, int count, std::int16_t *to, int room) {
    return PushEnhancementAudio(stream.get(), pcm, count, to, room);
  };
  const auto flush = [&](std::int16_t *to, int room) {
    return FlushEnhancementStream(stream.get(), to, room);
  };
  const auto *pcm = frame.data();
  EXPECT_EQ(GetEnhancementCounts(stream.get(), nullptr), -1);
  for (const int result :
       {push(none, 1, out, 160), push(pcm, 160, none, 112), push(pcm, -1, out, 160),
        push(pcm, 1, out, -1), push(pcm, 160, out, 111)})
    EXPECT_EQ(result, -1);
  EXPECT_EQ(push(pcm, 159, none, 0), 0);
  EXPECT_EQ(push(pcm, 1, out, 112), 112);
  for (const int result : {flush(out, 47), flush(none, 48), flush(out, -1)}) EXPECT_EQ(result, -1);
  EXPECT_EQ(flush(out, 48), 48);
  EXPECT_EQ(flush(none, 0), 0);
  EXPECT_EQ(push(none, 0, none, 0), -1) << "after the flush";
  stream = open({2, 13, 0, 1});
  EXPECT_EQ(push(pcm, 3, out, 160), 0);
  EXPECT_EQ(flush(out, ENHANCEMENT_HELD_BACK), -1) << "half a pair";
}

constexpr Settings kPair = {2, 13, 0, 1};

/// The same by the suppressor of two microphones that all callers of the flat interface share.
Pcm by_flat_interface(Pcm pairs) {
  NsInstance *ns = InitializeDoNS(0, 2, 0);
  for (std::size_t at = 0; at < pairs.size(); at += 320)
    ProcessDoNSFrame(ns, &pairs[at], 320, &pairs[at], 320);
  FreeMemoryNS(ns);
  return pairs;
}

TEST(EnhancementStream, StreamsDoNotMeet) {
  // Two in turn,
  const Pcm inputs[] = {audio(2, 1), audio(2, 5)};
  const Stream streams[] = {open(kPair), open(kPair)};
  Pcm out[2];
  for (std::ptrdiff_t at = 0; at < std::ssize(inputs[0]); at += 320)
    for (const int i : {0, 1}) push(streams[i], part(inputs[i], at, 320), out[i]);
  for (const int i : {0, 1})
    EXPECT_EQ(out[i], part(enhanced(kPair, inputs[i]), 0, std::ssize(out[i])));
  // and sixteen threads: all but one with a stream, that one with the flat suppressor.
  const auto work = [&](unsigned i) {
    return i == 0 ? by_flat_interface(inputs[0]) : enhanced(kPair, inputs[i % 2]);
  };
  std::array<Pcm, 16> together;
  std::vector<std::thread> threads;
  for (unsigned i = 0; i < together.size(); ++i)
    threads.emplace_back([&, i] { together[i] = work(i); });
  for (std::thread &thread : threads) thread.join();
  for (unsigned i = 0; i < together.size(); ++i) EXPECT_EQ(together[i], work(i)) << i;
}

TEST(EnhancementStream, TakesItsMemoryWhenItOpensAndGivesItBack) {
  const Settings both = {2, 13, 1, 1};
  const auto in_use_after = [&](int rounds) {
    for (int round = 0; round < rounds; ++round) {
      CloseEnhancementStream(OpenEnhancementStream(&both));
      const auto memory = ScriptedMalloc::failing(round % 3);
      EXPECT_EQ(OpenEnhancementStream(&both), nullptr);
    }
    return mallinfo2().uordblks;
  };
  const auto before = in_use_after(100);  // the C library keeps a few blocks at hand
  EXPECT_EQ(in_use_after(2000), before);

  const Pcm in = audio(2), expected = enhanced(both, in);
  const Stream stream = open(both);
  Pcm out(in.size());
  const auto memory = ScriptedMalloc::failing();
  const int32_t room = std::ssize(out);
  int32_t ready = PushEnhancementAudio(stream.get(), in.data(), room, out.data(), room);
  ready += FlushEnhancementStream(stream.get(), &out[ready], room - ready);
  EXPECT_EQ(part(out, 0, ready), expected);
}

}  // namespace
}  // namespace orvalis::test
