// Noise suppression with one and with two microphones: every field after every call, and all of the
// output buffer.
#include <memory>

#include "Voice_Engine/ns/ns_instance.h"
#include "Voice_Engine/ns/s2chns.h"
#include "tests/digests/observe.h"
#include "tests/digests/records.h"

namespace orvalis::test {
namespace {

void take_record(Judge &judge, const NsInstance &ns) {
  judge.take(ns.pcmDumpEnabled, ns.rateMode, ns.micCount, ns.reserved, ns.processedSamples,
             ns.abnormalCheckCount);
  take_record(judge, ns.suppressor);
}

void take_record(Judge &judge, const S2chnsState &state) {
  judge.take(state.frame_history[0], state.frame_history[1], state.overlap_tail, state.spp_smoothed,
             state.spp_prev, state.frame_count);
  for (const Matrices *covariance : {&state.Phi_yy, &state.Phi_vv})
    judge.take(covariance->re, covariance->im);
}

/// Through the flat interface: one frame at a time, or, if hostile, as no caller should.
void run(Judge &judge, const Pcm &audio, std::int32_t mode, std::int32_t microphones,
         Caller caller) {
  auto &[random, hostile] = caller;
  Observer observer(judge);
  NsInstance *ns =
      InitializeDoNS(mode, microphones, static_cast<std::int32_t>(draw(random, -1, 1)));
  observer.watch(ns);
  constexpr std::size_t kRoom = 3000;  // the call may write beyond its count
  const std::int32_t rate_digit = mode / 1000 % 10;
  const std::int32_t frame = microphones == 2 || rate_digit == 2 ? 320 : rate_digit < 2 ? 160 : 80;
  Pcm out(kRoom);
  for (std::size_t at = 0; at + kRoom <= audio.size();) {
    Pcm in(audio.begin() + static_cast<long>(at), audio.begin() + static_cast<long>(at + kRoom));
    for (std::size_t i = 0; i < out.size(); ++i) out[i] = static_cast<std::int16_t>(i);
    std::int32_t count = frame;
    std::int32_t answer = 0;
    const auto oddity = hostile ? draw(random, 0, 63) : 63;
    if (hostile) observer.disturb_flags(random);
    if (oddity == 0) answer = ProcessDoNSFrame(ns, nullptr, count, out.data(), count);
    if (oddity == 1) answer = ProcessDoNSFrame(ns, in.data(), count, nullptr, count);
    if (oddity == 2) answer = ProcessDoNSFrame(nullptr, in.data(), count, out.data(), count);
    if (oddity == 3) answer = ProcessDoNSFrame(ns, in.data(), count, out.data(), count + 1);
    if (oddity == 4) answer = ProcessDoNSFrame(ns, in.data(), -count, out.data(), -count);
    if (oddity >= 5) {
      if (oddity < 10) count *= static_cast<std::int32_t>(draw(random, 2, 7));
      if (oddity == 10) count += static_cast<std::int32_t>(draw(random, 1, 3 * count));
      Pcm &result = microphones != 2 && oddity < 30 ? in : out;
      answer = ProcessDoNSFrame(ns, in.data(), count, result.data(), count);
      at += static_cast<std::size_t>(count / frame * frame);
    }
    judge.take(answer, in, out);
    take_record(judge, *ns);
    observer.call();
  }
  judge.take(FreeMemoryNS(ns));
  observer.take_dumps();
}

/// Speech that reaches the second microphone later and weaker, under noise of their own.
Pcm pairs_of(const Pcm &speech) {
  Random random(7);
  Pcm pairs;
  for (std::size_t i = 0; i < speech.size(); ++i) {
    pairs.push_back(clipped(speech[i] + draw(random, -300, 300)));
    pairs.push_back(clipped((i < 3 ? 0 : 13 * speech[i - 3] / 16) + draw(random, -300, 300)));
  }
  return pairs;
}

Pcm interleaved(const Pcm &first, const Pcm &second) {
  Pcm pairs;
  for (std::size_t i = 0; i < first.size(); ++i) {
    pairs.push_back(first[i]);
    pairs.push_back(second[i]);
  }
  return pairs;
}

/// Straight into the two-microphone suppressor, whose record the flat interface hides.
void run_two(Judge &judge, const Pcm &pairs, std::int16_t frames) {
  Observer observer(judge);
  const auto state = std::make_unique<S2chnsState>();
  const auto samples = static_cast<std::size_t>(frames * 2 * kHop);
  for (std::size_t at = 0; at + samples <= pairs.size(); at += samples) {
    Pcm out(samples, 1234);
    judge.take(S2CHNSProcessNSFrame(*state, &pairs[at], out.data(),
                                    static_cast<std::int16_t>(frames * kHop)),
               out);
    take_record(judge, *state);
    observer.call();
  }
}

TEST(Digests, OneMicrophone) {
  Judge judge("one_microphone");
  const Pcm speech = speech_16k(kSentences[4]);
  judge.sequence("sentence", [&] { run(judge, speech, 0, 1, {Random(1), false}); });
  judge.sequence("sentence-strong", [&] {
    run(judge, speech_16k(kSentences[1]), 2, 1, {Random(1), false});
  });
  int seed = 100;
  for (const std::int32_t mode : {0, 2, 0, 2, 1000, 2000, 3002, -1000}) {
    ++seed;
    judge.sequence("hostile-" + std::to_string(seed) + "-mode" + std::to_string(mode), [&] {
      run(judge, hostile_signal(static_cast<std::uint64_t>(seed), 100000, speech), mode, 1,
          {Random(static_cast<std::uint64_t>(seed)), true});
    });
  }
  judge.sequence("no-microphone", [&] { run(judge, speech, 0, 3, {Random(3), true}); });
  judge.sequence("default-log", [&] {
    judge.take(last_words([] {
      static NsInstance *const ns = InitializeDoNS(0, 1, 0);  // releases would log the handle
      static EpdInstance *const epd = InitializeEPD(0, 0);
      Pcm frame(160, 1000);
      ProcessDoNSFrame(ns, frame.data(), 80, frame.data(), 80);
      ResetEPDparams(epd);
    }));
    judge.call();
  });
  judge.sequence("gain-floors", [&] {
    for (const Word16 mode : {0, 1, 2, 3, 4, -1}) {
      S1chnsState state{};
      judge.take(S1CHNSInit(&state, mode));
      take_record(judge, state);
      judge.call();
    }
  });
  judge.sequence("refusals", [&] {
    Observer observer(judge);
    {
      const auto exhausted = ScriptedMalloc::failing();
      judge.take(InitializeDoNS(2, 1, 0) == nullptr);
    }
    observer.call();
    NsInstance *ns = InitializeDoNS(0, 1, 0);
    observer.watch(ns);
    judge.take(ProcessDoNSFrame(ns, nullptr, 0, nullptr, 0));
    FreeMemoryNS(ns);
    observer.call();
    judge.take(FreeMemoryNS(nullptr));
    judge.take(FreeMemoryNS(reinterpret_cast<NsInstance *>(std::intptr_t{-1})));
    observer.call();
  });
}

TEST(Digests, TwoMicrophones) {
  Judge judge("two_microphones");
  const Pcm speech = speech_16k(kSentences[1]);
  const Pcm pairs = pairs_of(speech);
  judge.sequence("sentence", [&] { run(judge, pairs, 0, 2, {Random(1), false}); });
  judge.sequence("record", [&] { run_two(judge, pairs, 1); });
  judge.sequence("record-two-frames",
                 [&] { run_two(judge, Pcm(pairs.begin(), pairs.begin() + 40000), 2); });
  judge.sequence("record-twins", [&] { run_two(judge, interleaved(speech, speech), 1); });
  judge.sequence("record-dying", [&] {
    Pcm dying = pairs;
    for (std::size_t i = pairs.size() / 3 | 1; i < 2 * pairs.size() / 3; i += 2) dying[i] = 0;
    run_two(judge, dying, 1);
  });
  judge.sequence("barely-audible", [&] {
    Pcm quiet;
    for (int frame = 0; frame < 60; ++frame) {
      for (int i = 0; i < 160; ++i) {  // magnitudes that sum up to 1599, 1600 or 1601
        const int sample = i == 0 ? 9 + frame % 3 : 10;
        quiet.push_back(static_cast<std::int16_t>((frame + i) % 3 == 0 ? -sample : sample));
        quiet.push_back(static_cast<std::int16_t>(i * frame % 100));
      }
    }
    run_two(judge, quiet, 1);
  });
  judge.sequence("bad-length", [&] {
    S2chnsState state{};
    Pcm out(2000, 7);
    for (const Word16 n : {-160, -1, 0, 1, 159, 161, 321})
      judge.take(S2CHNSProcessNSFrame(state, pairs.data(), out.data(), n), out);
    take_record(judge, state);
    judge.call();
  });
  for (std::uint64_t seed = 200; seed < 204; ++seed) {
    const Pcm hostile =
        interleaved(hostile_signal(seed, 60000, speech), hostile_signal(seed + 50, 60000, speech));
    judge.sequence("hostile-" + std::to_string(seed), [&] {
      run(judge, hostile, 0, 2, {Random(seed), true});
    });
    judge.sequence("record-hostile-" + std::to_string(seed), [&] { run_two(judge, hostile, 1); });
  }
  judge.sequence("gates", [&] {
    for (float x = -11; x <= 11; x += 0x1p-9F) judge.take(SAFE_EXP(x), SAFE_SAP(x / 4));
    judge.call();
  });
}

}  // namespace
}  // namespace orvalis::test
