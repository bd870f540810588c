// The enhancement stream against the engine's frames, and what holds for any audio: chunk sizes,
// ends, delays, several streams. Linked with --wrap for malloc.
#include "stream/enhancement_stream.h"

#include <gtest/gtest.h>
#include <malloc.h>

#include <algorithm>
#include <array>
#include <cmath>
#include <optional>
#include <random>
#include <string>
#include <thread>
#include <vector>

#include "jni/orvalis.h"
#include "tests/support/noise.h"
#include "tests/support/random.h"
#include "tests/support/scripted_malloc.h"

namespace orvalis::test {
namespace {

using Settings = EnhancementSettings;
using Values = std::vector<std::int64_t>;

Pcm part(const Pcm &samples, std::ptrdiff_t from, std::ptrdiff_t count) {
  return {samples.begin() + from, samples.begin() + from + count};
}

/// A stream and its output. Each call is first refused for lack of room, then gets exactly the room
/// that is promised to suffice, with a guard behind it.
class Enhancer {
public:
  explicit Enhancer(const Settings &settings)
      : microphones_(settings.microphones), stream_(OpenEnhancementStream(&settings)) {
    EXPECT_NE(stream_, nullptr);
  }
  ~Enhancer() { EXPECT_EQ(CloseEnhancementStream(stream_), 0); }
  Enhancer(const Enhancer &) = delete;
  Enhancer &operator=(const Enhancer &) = delete;

  int delay() const { return EnhancementDelay(stream_); }
  const Pcm &output() const { return output_; }

  Values counts() const {
    EnhancementCounts c;
    EXPECT_EQ(GetEnhancementCounts(stream_, &c), 0);
    const auto &[in, loud, out, is_loud] = c;
    return {in.count, in.first, loud.count, loud.first, out.count, out.first, is_loud};
  }

  void push(const Pcm &chunk) {
    const int count = static_cast<int>(chunk.size());
    write(count / microphones_ + 160, [&](std::int16_t *out, int room) {
      return PushEnhancementAudio(stream_, chunk.data(), count, out, room);
    });
  }

  void flush() {
    write(ENHANCEMENT_HELD_BACK,
          [&](std::int16_t *out, int room) { return FlushEnhancementStream(stream_, out, room); });
  }

private:
  void write(int room, auto call) {
    constexpr std::int16_t kGuard = 12345;
    Pcm out(room + 1, kGuard);
    const int none = call(out.data(), 0);
    EXPECT_EQ(out, Pcm(room + 1, kGuard));
    if (none == 0) return;
    EXPECT_EQ(none, -1);
    const int ready = call(out.data(), room);
    ASSERT_GT(ready, 0);
    ASSERT_LE(ready, room);
    EXPECT_EQ(part(out, ready, room + 1 - ready), Pcm(room + 1 - ready, kGuard));
    output_.insert(output_.end(), out.begin(), out.begin() + ready);
  }

  int microphones_;
  EnhancementStream *stream_;
  Pcm output_;
};

Pcm enhanced(const Settings &settings, const Pcm &input) {
  Enhancer stream(settings);
  stream.push(input);
  stream.flush();
  return stream.output();
}

std::vector<Settings> all_settings() {
  std::vector<Settings> all;
  for (const int level : {0, 1})
    for (const int aligned : {0, 1})
      for (const auto &[microphones, db] : {std::pair{1, 0}, {1, 13}, {1, 18}, {2, 0}, {2, 13}})
        all.push_back({microphones, db, level, aligned});
  return all;
}

std::string describe(const Settings &s) {
  return std::to_string(s.microphones) + " microphones, " + std::to_string(s.suppression_db) +
         " dB" + (s.level ? ", level" : "") + (s.aligned ? ", aligned" : "");
}

/// Hiss that does not settle, speech in noise, silence and full scale.
Pcm audio(int microphones, unsigned seed = 1) {
  const Pcm speech = speech_16k("goforward.raw");
  const auto noise = unit_noise(microphones * speech.size(), NoiseColour::kPink, seed);
  Pcm samples;
  for (int at = 0; at < std::ssize(noise); ++at) {
    const int i = at / microphones, c = at % microphones;
    double sample = i < 1200 ? (i % 2 ? 3 : -2) : 2 * speech[i] / (c + 1) + 150 * noise[at];
    if (i / 1500 == 9) sample = 0;
    if (i / 1500 == 12) sample = 40000 * std::sin(0.1 * i);
    samples.push_back(to_sample(sample));
  }
  return samples;
}

class EnhancementStreamTest : public testing::Test {
protected:
  EnhancementStreamTest() { SetLogSink(LogNothing, nullptr); }
  ~EnhancementStreamTest() override { SetLogSink(nullptr, nullptr); }
};

TEST_F(EnhancementStreamTest, IsTheEngineFrameByFrameWithTheDelayedInputWhereItIsSilent) {
  for (const auto &[microphones, db, mode, delay] :
       {std::array{1, 13, 0, 48}, {1, 18, 2, 48}, {2, 13, 0, 160}}) {
    SCOPED_TRACE(microphones * 100 + db);
    Pcm in = audio(microphones);
    const int frame = 160 * microphones;
    in.resize(in.size() / frame * frame);
    Pcm expected;
    NsInstance *ns = InitializeDoNS(mode, microphones, 0);
    for (int at = 0; at < std::ssize(in); at += frame) {
      Pcm work = part(in, at, frame), out(frame);
      for (int i = 0; i < frame; ++i) {
        const int source = at + (i / microphones - delay) * microphones;
        out[i] = source < 0 ? std::int16_t{0} : in[source];
      }
      ProcessDoNSFrame(ns, work.data(), frame, out.data(), frame);
      for (int i = 0; i < frame; i += microphones) expected.push_back(out[i]);
    }
    FreeMemoryNS(ns);

    Enhancer stream({microphones, db, 0, 0});
    EXPECT_EQ(stream.delay(), delay);
    stream.push(in);
    EXPECT_EQ(stream.output(), expected);
  }
  const Pcm pairs = audio(2);
  Pcm first;
  for (std::size_t i = 0; i < pairs.size(); i += 2) first.push_back(pairs[i]);
  EXPECT_EQ(enhanced({2, 0, 0, 0}, pairs), first);
  EXPECT_EQ(enhanced({1, 0, 0, 1}, first), first);
  EXPECT_EQ(Enhancer({2, 0, 1, 0}).delay(), 0);

  Pcm levelled = first;
  levelled.resize(levelled.size() / 160 * 160);
  const std::int64_t drc = InitializeDRC(16000, 0);
  for (std::size_t at = 0; at < levelled.size(); at += 160) ProcessDRC(drc, &levelled[at], 160);
  FreeMemoryDRC(drc);
  Pcm whole_frames = enhanced({1, 0, 1, 1}, first);
  whole_frames.resize(levelled.size());
  EXPECT_EQ(whole_frames, levelled);
}

TEST_F(EnhancementStreamTest, KeepsLengthDelayAndOrderAndMirrorsTheEnd) {
  for (const Settings &settings : all_settings()) {
    const auto &[microphones, db, level, aligned] = settings;
    const int delay = Enhancer(settings).delay();
    const Pcm whole = audio(microphones);
    for (const int n : {0, 1, 7, 47, 48, 112, 159, 160, 161, 319, 321, 479, 481, 5000}) {
      SCOPED_TRACE(describe(settings) + ", " + std::to_string(n));
      const Pcm in = part(whole, 8000 * microphones, n * microphones);
      Pcm out = enhanced(settings, in);
      ASSERT_EQ(std::ssize(out), aligned || n == 0 ? n : n + delay);
      if (!aligned) {
        if (n > 0) out.erase(out.begin(), out.begin() + delay);
        EXPECT_EQ(out, enhanced({microphones, db, level, 1}, in));
      } else if (level && (db > 0 || microphones == 2)) {
        EXPECT_EQ(out, enhanced({1, 0, 1, 1}, enhanced({microphones, db, 0, 1}, in)));
      } else {
        // The end is as if the audio went on backwards, forwards and so on.
        Pcm mirrored = in;
        for (int i = 0; n > 0 && i < 500; ++i) {
          const int at = i / n % 2 ? i % n : n - 1 - i % n;
          for (int c = 0; c < microphones; ++c) mirrored.push_back(in[at * microphones + c]);
        }
        EXPECT_EQ(out, part(enhanced(settings, mirrored), 0, n));
      }
    }
  }
}

TEST_F(EnhancementStreamTest, NothingDependsOnTheCut) {
  auto generator = seeded_generator();
  for (const Settings &settings : all_settings()) {
    SCOPED_TRACE(describe(settings));
    const Pcm whole = audio(settings.microphones);
    const Pcm in = part(whole, 0, std::ssize(whole) - 71 * settings.microphones);
    const auto results = [&](auto next_length) {
      Enhancer stream(settings);
      for (std::ptrdiff_t at = 0, length; at < std::ssize(in); at += length) {
        length = std::min<std::ptrdiff_t>(next_length(), std::ssize(in) - at);
        stream.push(part(in, at, length));
      }
      stream.flush();
      return std::pair(stream.output(), stream.counts());
    };
    const auto expected = results([&] { return std::ssize(in); });
    for (int round = 0; round < 10; ++round) {
      std::uniform_real_distribution<double> exponent(0, round % 5 == 0 ? 2 : 4);
      ASSERT_EQ(results([&] { return std::pow(10.0, exponent(generator)); }), expected) << round;
    }
  }
}

TEST_F(EnhancementStreamTest, CountsWhatIsLoudAndClipped) {
  // A second of a tone that is not loud, then half a second of one that is and clips.
  Pcm tone;
  for (int i = 0; i < 24000; ++i)
    tone.push_back(to_sample((i < 16050 ? 2000 : 40000) * std::sin(i * 0.1)));
  const auto is_clipped = [](int x) { return x == 32767 || x == -32768; };
  const auto clipped = [&](const Pcm &x) { return std::ranges::count_if(x, is_clipped); };
  const auto first = [&](const Pcm &x) { return std::ranges::find_if(x, is_clipped) - x.begin(); };
  for (const int microphones : {1, 2}) {
    Pcm in;
    for (const std::int16_t sample : tone) in.insert(in.end(), microphones, sample);
    Enhancer stream({microphones, 0, 1, 1});
    EXPECT_EQ(stream.counts(), (Values{0, -1, 0, -1, 0, -1, 0}));
    stream.push(in);
    const Pcm &out = stream.output();
    EXPECT_EQ(stream.counts(), (Values{microphones * clipped(tone), first(tone), 50, 16000,
                                       clipped(out), first(out), 1}));
    stream.push(Pcm(1760 * microphones));
    EXPECT_EQ(stream.counts().back(), 0);
  }
}

TEST_F(EnhancementStreamTest, RefusesBadArguments) {
  EXPECT_EQ(OpenEnhancementStream(nullptr), nullptr);
  const int refused[][4] = {{0, 0, 0, 1},  {3, 13, 0, 1},  {-1, 18, 0, 1},
                            {1, 14, 0, 1}, {2, 18, 0, 1},  {1, -13, 0, 1},
                            {1, 13, 2, 1}, {1, 13, -1, 1}, {1, 13, 0, 2}};
  for (const auto &[microphones, db, level, aligned] : refused) {
    const Settings bad = {microphones, db, level, aligned};
    EXPECT_EQ(OpenEnhancementStream(&bad), nullptr) << describe(bad);
  }
  EnhancementCounts counts;
  EXPECT_EQ(EnhancementDelay(nullptr), -1);
  EXPECT_EQ(PushEnhancementAudio(nullptr, nullptr, 0, nullptr, 0), -1);
  EXPECT_EQ(FlushEnhancementStream(nullptr, nullptr, 0), -1);
  EXPECT_EQ(GetEnhancementCounts(nullptr, &counts), -1);
  EXPECT_EQ(CloseEnhancementStream(nullptr), -1);

  std::int16_t out[ENHANCEMENT_HELD_BACK];
  const Pcm frame(160, 1000);
  const Settings one = ENHANCEMENT_SETTINGS_DEFAULT, two = {2, 13, 0, 1};
  EnhancementStream *stream = OpenEnhancementStream(&one);
  const auto push = [&](const std::int16_t *pcm, int count, std::int16_t *to, int room) {
    return PushEnhancementAudio(stream, pcm, count, to, room);
  };
  EXPECT_EQ(GetEnhancementCounts(stream, nullptr), -1);
  EXPECT_EQ(push(nullptr, 1, out, 160), -1);
  EXPECT_EQ(push(frame.data(), 160, nullptr, 112), -1);
  EXPECT_EQ(push(frame.data(), -1, out, 160), -1);
  EXPECT_EQ(push(frame.data(), 1, out, -1), -1);
  EXPECT_EQ(push(frame.data(), 160, out, 111), -1);
  EXPECT_EQ(push(frame.data(), 159, nullptr, 0), 0);
  EXPECT_EQ(push(frame.data(), 1, out, 112), 112);
  EXPECT_EQ(FlushEnhancementStream(stream, out, 47), -1);
  EXPECT_EQ(FlushEnhancementStream(stream, nullptr, 48), -1);
  EXPECT_EQ(FlushEnhancementStream(stream, out, 48), 48);
  EXPECT_EQ(FlushEnhancementStream(stream, nullptr, 0), 0);
  EXPECT_EQ(push(nullptr, 0, nullptr, 0), -1);
  EXPECT_EQ(CloseEnhancementStream(stream), 0);

  stream = OpenEnhancementStream(&two);
  EXPECT_EQ(push(frame.data(), 3, out, 160), 0);
  EXPECT_EQ(FlushEnhancementStream(stream, out, ENHANCEMENT_HELD_BACK), -1) << "half a pair";
  EXPECT_EQ(push(frame.data(), 1, out, 160), 0);
  EXPECT_EQ(FlushEnhancementStream(stream, out, ENHANCEMENT_HELD_BACK), 2);
  EXPECT_EQ(CloseEnhancementStream(stream), 0);
}

constexpr Settings kPair = {2, 13, 0, 1};

TEST_F(EnhancementStreamTest, StreamsAndTheFlatSuppressorOfTwoMicrophonesDoNotMeet) {
  const Pcm inputs[] = {audio(2, 1), audio(2, 5), audio(2, 9)};
  constexpr int kFrames = 250, kLate = 100, kValues = 320;
  const auto frame = [&](int input, int number) {
    return part(inputs[input], number * kValues, kValues);
  };
  const auto suppress = [](NsInstance *ns, Pcm in, Pcm &output) {
    Pcm out = in;
    ProcessDoNSFrame(ns, in.data(), kValues, out.data(), kValues);
    output.insert(output.end(), out.begin(), out.end());
  };
  Pcm flat_alone, flat;
  NsInstance *ns = InitializeDoNS(0, 2, 0);
  for (int i = 0; i < kFrames; ++i) suppress(ns, frame(2, i), flat_alone);
  FreeMemoryNS(ns);

  ns = InitializeDoNS(0, 2, 0);
  Enhancer first(kPair);
  std::optional<Enhancer> second;
  for (int i = 0; i < kFrames; ++i) {
    first.push(frame(0, i));
    suppress(ns, frame(2, i), flat);
    if (i == kLate) second.emplace(kPair);
    if (second) second->push(frame(1, i));
  }
  FreeMemoryNS(ns);
  first.flush();
  second->flush();
  EXPECT_EQ(flat, flat_alone);
  EXPECT_EQ(first.output(), enhanced(kPair, part(inputs[0], 0, kFrames * kValues)));
  EXPECT_EQ(second->output(),
            enhanced(kPair, part(inputs[1], kLate * kValues, (kFrames - kLate) * kValues)));
}

TEST_F(EnhancementStreamTest, SixteenThreadsGiveWhatEachGivesAlone) {
  constexpr int kThreads = 16;
  std::array<Pcm, kThreads> inputs, together;
  for (unsigned i = 0; i < kThreads; ++i) inputs[i] = part(audio(2, i), 0, 32000);
  std::vector<std::thread> threads;
  for (int i = 0; i < kThreads; ++i)
    threads.emplace_back([&, i] { together[i] = enhanced(kPair, inputs[i]); });
  for (std::thread &thread : threads) thread.join();
  for (int i = 0; i < kThreads; ++i) EXPECT_EQ(together[i], enhanced(kPair, inputs[i])) << i;
}

TEST_F(EnhancementStreamTest, TakesItsMemoryWhenItOpensAndGivesItBack) {
  const Settings both = {2, 13, 1, 1};
  const Pcm in = audio(2);
  const Pcm expected = enhanced(both, in);
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

  EnhancementStream *stream = OpenEnhancementStream(&both);
  Pcm out(in.size());
  const int count = static_cast<int>(in.size());
  const auto memory = ScriptedMalloc::failing();
  int ready = PushEnhancementAudio(stream, in.data(), count, out.data(), count);
  ready += FlushEnhancementStream(stream, &out[ready], count - ready);
  EXPECT_EQ(part(out, 0, ready), expected);
  CloseEnhancementStream(stream);
}

}  // namespace
}  // namespace orvalis::test
