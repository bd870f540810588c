// The enhancement stream against the engine's frames and against laws that hold for any audio:
// cuts, ends, delays, neighbours. Linked with --wrap for malloc.
#include "stream/enhancement_stream.h"

#include <gtest/gtest.h>
#include <malloc.h>

#include <array>
#include <cmath>
#include <memory>
#include <random>
#include <thread>
#include <vector>

#include "jni/orvalis.h"
#include "tests/support/noise.h"
#include "tests/support/random.h"
#include "tests/support/scripted_malloc.h"

namespace orvalis::test {
namespace {

constexpr std::int16_t kGuard = 12345;

struct Closer {
  void operator()(EnhancementStream *stream) const { EXPECT_EQ(CloseEnhancementStream(stream), 0); }
};
using Stream = std::unique_ptr<EnhancementStream, Closer>;

Stream open(const EnhancementSettings &settings) {
  Stream stream(OpenEnhancementStream(&settings));
  EXPECT_NE(stream, nullptr);
  return stream;
}

std::vector<EnhancementSettings> all_settings() {
  std::vector<EnhancementSettings> all;
  for (const int level : {0, 1})
    for (const int aligned : {0, 1})
      for (const auto &[microphones, db] : {std::pair{1, 0}, {1, 13}, {1, 18}, {2, 0}, {2, 13}})
        all.push_back({microphones, db, level, aligned});
  return all;
}

std::string describe(const EnhancementSettings &s) {
  return std::to_string(s.microphones) + " microphones, " + std::to_string(s.suppression_db) +
         " dB" + (s.level ? ", level" : "") + (s.aligned ? ", aligned" : "");
}

/// All that a push, or without samples the flush, gives into exactly the room that is promised.
Pcm written_by(std::size_t room, auto call) {
  Pcm out(room + 1, kGuard);
  const std::int32_t ready = call(out.data(), static_cast<std::int32_t>(room));
  EXPECT_GE(ready, 0);
  EXPECT_LE(ready, static_cast<std::int32_t>(room));
  EXPECT_EQ(out.back(), kGuard);
  out.resize(static_cast<std::size_t>(ready));
  return out;
}

void push(const Stream &stream, std::size_t microphones, const Pcm &chunk, Pcm &output) {
  const Pcm out = written_by(chunk.size() / microphones + 160, [&](auto *to, std::int32_t room) {
    const Pcm copy = chunk;
    const auto count = static_cast<std::int32_t>(chunk.size());
    const std::int32_t ready = PushEnhancementAudio(stream.get(), chunk.data(), count, to, room);
    EXPECT_EQ(chunk, copy);
    return ready;
  });
  output.insert(output.end(), out.begin(), out.end());
}

void flush(const Stream &stream, Pcm &output) {
  const Pcm out = written_by(ENHANCEMENT_HELD_BACK, [&](auto *to, std::int32_t room) {
    return FlushEnhancementStream(stream.get(), to, room);
  });
  output.insert(output.end(), out.begin(), out.end());
}

Pcm enhanced(const EnhancementSettings &settings, const Pcm &input) {
  const Stream stream = open(settings);
  Pcm output;
  push(stream, static_cast<std::size_t>(settings.microphones), input, output);
  flush(stream, output);
  return output;
}

EnhancementSettings with(EnhancementSettings settings, int EnhancementSettings::*field, int value) {
  settings.*field = value;
  return settings;
}

/// Hiss that does not settle, speech in noise, silence and full scale; a pair is two of them.
Pcm audio(int microphones, unsigned seed = 1) {
  const Pcm speech = speech_16k("goforward.raw");
  Pcm samples;
  for (int c = 0; c < microphones; ++c) {
    const auto noise = unit_noise(speech.size(), NoiseColour::kPink, seed + c);
    for (std::size_t i = 0; i < speech.size(); ++i) {
      double sample = i < 1200 ? (i % 2 ? 3 : -2) : 2 * speech[i] / (c + 1) + 150 * noise[i];
      if (i / 1500 == 9) sample = 0;
      if (i / 1500 == 12) sample = 40000 * std::sin(0.1 * static_cast<double>(i));
      const std::size_t at = i * microphones + c;
      samples.resize(std::max(samples.size(), at + 1));
      if (c == 0 && microphones == 2) samples.resize(at + 2);
      samples[at] = to_sample(sample);
    }
  }
  return samples;
}

class EnhancementStreamTest : public testing::Test {
protected:
  EnhancementStreamTest() {
    SetLogSink([](int, const char *, const char *, void *) {}, nullptr);
  }
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
      Pcm work(in.begin() + at, in.begin() + at + frame), out(frame);
      for (int i = 0; i < frame; ++i) {
        const int source = at + (i / microphones - delay) * microphones;
        out[i] = source < 0 ? std::int16_t{0} : in[source];
      }
      ProcessDoNSFrame(ns, work.data(), frame, out.data(), frame);
      for (int i = 0; i < frame; i += microphones) expected.push_back(out[i]);
    }
    FreeMemoryNS(ns);

    const Stream stream = open({microphones, db, 0, 0});
    EXPECT_EQ(EnhancementDelay(stream.get()), delay);
    Pcm output;
    push(stream, microphones, in, output);
    EXPECT_EQ(output, expected);
  }
  const Pcm pairs = audio(2);
  Pcm first;
  for (std::size_t i = 0; i < pairs.size(); i += 2) first.push_back(pairs[i]);
  EXPECT_EQ(enhanced({2, 0, 0, 0}, pairs), first);
  EXPECT_EQ(enhanced({1, 0, 0, 1}, first), first);
  EXPECT_EQ(EnhancementDelay(open({2, 0, 1, 0}).get()), 0);

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
  for (const EnhancementSettings &settings : all_settings()) {
    const auto microphones = static_cast<std::size_t>(settings.microphones);
    const auto delay = static_cast<std::size_t>(EnhancementDelay(open(settings).get()));
    const Pcm whole = audio(settings.microphones);
    for (const std::size_t n : {0, 1, 7, 47, 48, 112, 159, 160, 161, 319, 321, 479, 481, 5000}) {
      SCOPED_TRACE(describe(settings) + ", " + std::to_string(n));
      const auto from = whole.begin() + static_cast<std::ptrdiff_t>(8000 * microphones);
      const Pcm in(from, from + static_cast<std::ptrdiff_t>(n * microphones));
      const Pcm out = enhanced(settings, in);
      ASSERT_EQ(out.size(), settings.aligned || n == 0 ? n : n + delay);
      if (!settings.aligned && n > 0) {
        const Pcm aligned = enhanced(with(settings, &EnhancementSettings::aligned, 1), in);
        EXPECT_EQ(Pcm(out.begin() + static_cast<std::ptrdiff_t>(delay), out.end()), aligned);
        continue;
      }
      if (settings.level && (settings.suppression_db > 0 || microphones == 2)) {
        const Pcm plain = enhanced(with(settings, &EnhancementSettings::level, 0), in);
        EXPECT_EQ(out, enhanced({1, 0, 1, 1}, plain)) << "first one, then the other";
        continue;
      }
      // The end is as if the audio went on backwards, forwards and so on.
      Pcm mirrored = in;
      for (std::size_t i = 0; n > 0 && i < 500; ++i) {
        const std::size_t at = i / n % 2 ? i % n : n - 1 - i % n;
        for (std::size_t c = 0; c < microphones; ++c) mirrored.push_back(in[at * microphones + c]);
      }
      Pcm longer = enhanced(settings, mirrored);
      longer.resize(n);
      EXPECT_EQ(out, longer);
    }
  }
}

std::vector<std::int64_t> values_of(const EnhancementCounts &c) {
  return {c.clipped_in.count,
          c.clipped_in.first,
          c.loud_frames.count,
          c.loud_frames.first,
          c.clipped_out.count,
          c.clipped_out.first,
          c.is_loud};
}

TEST_F(EnhancementStreamTest, NothingDependsOnTheCutOrOnRefusedRoom) {
  auto generator = seeded_generator();
  for (const EnhancementSettings &settings : all_settings()) {
    SCOPED_TRACE(describe(settings));
    const auto microphones = static_cast<std::size_t>(settings.microphones);
    Pcm in = audio(settings.microphones);
    in.resize(in.size() - 71 * microphones);
    const auto results = [&](auto next_length, auto &&before) {
      const Stream stream = open(settings);
      Pcm out;
      for (std::size_t at = 0; at < in.size();) {
        const std::size_t length = std::min<std::size_t>(next_length(), in.size() - at);
        const auto from = in.begin() + static_cast<std::ptrdiff_t>(at);
        const Pcm chunk(from, from + static_cast<std::ptrdiff_t>(length));
        before(stream, chunk);
        push(stream, microphones, chunk, out);
        at += length;
      }
      std::int16_t none = kGuard;
      EXPECT_EQ(FlushEnhancementStream(stream.get(), &none, 1), -1) << "more than one is left";
      EXPECT_EQ(none, kGuard);
      flush(stream, out);
      EnhancementCounts counts;
      EXPECT_EQ(GetEnhancementCounts(stream.get(), &counts), 0);
      return std::pair(out, values_of(counts));
    };
    const auto expected = results([&] { return in.size(); }, [](auto &&...) {});
    for (int round = 0; round < 10; ++round) {
      std::uniform_real_distribution<double> exponent(0, round % 5 == 0 ? 2 : 4);
      const auto refuse = [&](const Stream &stream, const Pcm &chunk) {
        // At least that many are ready, but for what is skipped and held back of the level.
        const auto least = static_cast<std::int32_t>(chunk.size() / microphones) - 480;
        if (least <= 0) return;
        Pcm out(static_cast<std::size_t>(least), kGuard);
        EXPECT_EQ(
            PushEnhancementAudio(stream.get(), chunk.data(),
                                 static_cast<std::int32_t>(chunk.size()), out.data(), least - 1),
            -1);
        EXPECT_EQ(out, Pcm(out.size(), kGuard));
      };
      const auto length = [&] {
        return static_cast<std::size_t>(std::pow(10.0, exponent(generator)));
      };
      ASSERT_EQ(results(length, refuse), expected) << "round " << round;
    }
  }
}

TEST_F(EnhancementStreamTest, CountsWhatIsLoudAndClipped) {
  // A second of a tone that is not loud, then half a second of one that is and clips.
  Pcm tone;
  for (int i = 0; i < 24000; ++i)
    tone.push_back(to_sample((i < 16050 ? 2000 : 40000) * std::sin(i * 0.1)));
  const auto clipped = [](const Pcm &samples) -> EnhancementCount {
    EnhancementCount found = {0, -1};
    for (std::size_t i = 0; i < samples.size(); ++i)
      if (std::abs(samples[i] + 0.5) > 32767 && found.count++ == 0)
        found.first = static_cast<std::int64_t>(i);
    return found;
  };
  for (const int microphones : {1, 2}) {
    Pcm in, out;
    for (const std::int16_t sample : tone) in.insert(in.end(), microphones, sample);
    const Stream stream = open({microphones, 0, 1, 1});
    EnhancementCounts counts;
    GetEnhancementCounts(stream.get(), &counts);
    EXPECT_EQ(values_of(counts), (std::vector<std::int64_t>{0, -1, 0, -1, 0, -1, 0}));
    push(stream, microphones, in, out);
    GetEnhancementCounts(stream.get(), &counts);
    const EnhancementCount before = clipped(tone), after = clipped(out);
    ASSERT_GT(after.count, 0);
    EXPECT_EQ(values_of(counts),
              (std::vector<std::int64_t>{microphones * before.count, before.first, 50, 16000,
                                         after.count, after.first, 1}));
    push(stream, microphones, Pcm(1760 * microphones), out);
    GetEnhancementCounts(stream.get(), &counts);
    EXPECT_EQ(counts.is_loud, 0);
  }
}

TEST_F(EnhancementStreamTest, RefusesBadArguments) {
  const EnhancementSettings good = ENHANCEMENT_SETTINGS_DEFAULT;
  EXPECT_EQ(OpenEnhancementStream(nullptr), nullptr);
  for (const EnhancementSettings &bad : {EnhancementSettings{0, 0, 0, 1},
                                         {3, 13, 0, 1},
                                         {-1, 18, 0, 1},
                                         {1, 14, 0, 1},
                                         {2, 18, 0, 1},
                                         {1, -13, 0, 1},
                                         {1, 13, 2, 1},
                                         {1, 13, -1, 1},
                                         {1, 13, 0, 2}})
    EXPECT_EQ(OpenEnhancementStream(&bad), nullptr) << describe(bad);
  EXPECT_EQ(EnhancementDelay(nullptr), -1);
  EXPECT_EQ(PushEnhancementAudio(nullptr, nullptr, 0, nullptr, 0), -1);
  EXPECT_EQ(FlushEnhancementStream(nullptr, nullptr, 0), -1);
  EXPECT_EQ(CloseEnhancementStream(nullptr), -1);
  EnhancementCounts counts;
  EXPECT_EQ(GetEnhancementCounts(nullptr, &counts), -1);

  const Stream stream = open(good), pairs = open({2, 13, 0, 1});
  EXPECT_EQ(GetEnhancementCounts(stream.get(), nullptr), -1);
  std::int16_t out[2 * ENHANCEMENT_HELD_BACK];
  const Pcm frame(160, 1000);
  EXPECT_EQ(PushEnhancementAudio(stream.get(), nullptr, 1, out, 160), -1);
  EXPECT_EQ(PushEnhancementAudio(stream.get(), frame.data(), 160, nullptr, 112), -1);
  EXPECT_EQ(PushEnhancementAudio(stream.get(), frame.data(), -1, out, 160), -1);
  EXPECT_EQ(PushEnhancementAudio(stream.get(), frame.data(), 1, out, -1), -1);
  EXPECT_EQ(PushEnhancementAudio(stream.get(), frame.data(), 160, out, 111), -1);
  EXPECT_EQ(PushEnhancementAudio(stream.get(), frame.data(), 159, nullptr, 0), 0);
  EXPECT_EQ(PushEnhancementAudio(stream.get(), frame.data(), 1, out, 112), 112);
  EXPECT_EQ(FlushEnhancementStream(stream.get(), out, 47), -1);
  EXPECT_EQ(FlushEnhancementStream(stream.get(), nullptr, 48), -1);
  EXPECT_EQ(FlushEnhancementStream(stream.get(), out, 48), 48);
  EXPECT_EQ(FlushEnhancementStream(stream.get(), nullptr, 0), 0);
  EXPECT_EQ(PushEnhancementAudio(stream.get(), nullptr, 0, nullptr, 0), -1);

  EXPECT_EQ(PushEnhancementAudio(pairs.get(), frame.data(), 3, out, 160), 0);
  EXPECT_EQ(FlushEnhancementStream(pairs.get(), out, ENHANCEMENT_HELD_BACK), -1) << "half a pair";
  EXPECT_EQ(PushEnhancementAudio(pairs.get(), frame.data(), 1, out, 160), 0);
  EXPECT_EQ(FlushEnhancementStream(pairs.get(), out, ENHANCEMENT_HELD_BACK), 2);
}

constexpr EnhancementSettings kPair = {2, 13, 0, 1};

TEST_F(EnhancementStreamTest, StreamsAndTheFlatSuppressorOfTwoMicrophonesDoNotMeet) {
  const Pcm inputs[] = {audio(2, 1), audio(2, 5), audio(2, 9)};
  constexpr std::ptrdiff_t kValues = 320;
  const auto frame_at = [&](int input, std::ptrdiff_t at) {
    const auto from = inputs[input].begin() + at;
    return Pcm(from, from + kValues);
  };
  const auto suppress = [](NsInstance *ns, Pcm frame, Pcm &output) {
    Pcm out = frame;
    ProcessDoNSFrame(ns, frame.data(), kValues, out.data(), kValues);
    output.insert(output.end(), out.begin(), out.end());
  };
  const std::ptrdiff_t end = std::ssize(inputs[0]) / kValues * kValues;
  Pcm flat_alone, flat, streamed[2];
  NsInstance *ns = InitializeDoNS(0, 2, 0);
  for (std::ptrdiff_t at = 0; at < end; at += kValues) suppress(ns, frame_at(2, at), flat_alone);
  FreeMemoryNS(ns);

  ns = InitializeDoNS(0, 2, 0);
  const Stream first = open(kPair);
  Stream second;
  for (std::ptrdiff_t at = 0; at < end; at += kValues) {
    push(first, 2, frame_at(0, at), streamed[0]);
    suppress(ns, frame_at(2, at), flat);
    if (at == 100 * kValues) second = open(kPair);
    if (second) push(second, 2, frame_at(1, at), streamed[1]);
  }
  FreeMemoryNS(ns);
  flush(first, streamed[0]);
  flush(second, streamed[1]);
  EXPECT_EQ(flat, flat_alone);
  EXPECT_EQ(streamed[0], enhanced(kPair, Pcm(inputs[0].begin(), inputs[0].begin() + end)));
  EXPECT_EQ(streamed[1],
            enhanced(kPair, Pcm(inputs[1].begin() + 100 * kValues, inputs[1].begin() + end)));
}

TEST_F(EnhancementStreamTest, SixteenThreadsGiveWhatEachGivesAlone) {
  constexpr int kThreads = 16;
  std::array<Pcm, kThreads> inputs, together;
  for (unsigned i = 0; i < kThreads; ++i) {
    inputs[i] = audio(2, 2 * i);
    inputs[i].resize(32000);
  }
  std::vector<std::thread> threads;
  for (int i = 0; i < kThreads; ++i)
    threads.emplace_back([&, i] { together[i] = enhanced(kPair, inputs[i]); });
  for (std::thread &thread : threads) thread.join();
  for (int i = 0; i < kThreads; ++i) EXPECT_EQ(together[i], enhanced(kPair, inputs[i])) << i;
}

TEST_F(EnhancementStreamTest, TakesItsMemoryWhenItOpensAndGivesItBack) {
  const EnhancementSettings both = {2, 13, 1, 1};
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

  const Stream stream = open(both);
  Pcm out(in.size());
  const auto memory = ScriptedMalloc::failing();
  const std::int32_t room = static_cast<std::int32_t>(out.size());
  std::int32_t ready = PushEnhancementAudio(stream.get(), in.data(),
                                            static_cast<std::int32_t>(in.size()), out.data(), room);
  ready += FlushEnhancementStream(stream.get(), &out[ready], room - ready);
  out.resize(ready);
  EXPECT_EQ(out, expected);
}

}  // namespace
}  // namespace orvalis::test
