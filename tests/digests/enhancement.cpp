// Noise suppression with one and with two microphones, and dynamics control: every field after
// every call, and all of the buffers.
#include <cmath>
#include <limits>
#include <memory>

#include "Voice_Engine/drc/dynamics_control.h"
#include "Voice_Engine/ns/ns_instance.h"
#include "Voice_Engine/ns/s2chns.h"
#include "tests/digests/observe.h"

namespace orvalis::test {
namespace {

void take_record(Judge &judge, const S2chnsState &state) {
  judge.take(state.frame_history[0], state.frame_history[1], state.overlap_tail, state.spp_smoothed,
             state.spp_prev, state.frame_count, state.Phi_yy.re, state.Phi_yy.im, state.Phi_vv.re,
             state.Phi_vv.im);
}

/// Suppression through the flat interface.
void run(Judge &judge, const std::string &name, const Pcm &audio, std::int32_t mode,
         std::int32_t microphones, Caller caller) {
  judge.sequence(name, [&] {
    Observer observer(judge);
    NsInstance *ns =
        InitializeDoNS(mode, microphones, static_cast<std::int32_t>(draw(caller.random, -1, 1)));
    observer.watch(ns);
    constexpr std::size_t kRoom = 3000;  // the call may write beyond its count
    const std::int32_t digit = mode / 1000 % 10;
    const std::int32_t frame = microphones == 2 || digit == 2 ? 320 : digit < 2 ? 160 : 80;
    Pcm out(kRoom);
    observer.drive(
        audio, caller, kRoom, frame, 5,
        [&](std::int64_t oddity, Pcm &in, std::int32_t count) {
          for (std::size_t i = 0; i < kRoom; ++i) out[i] = static_cast<std::int16_t>(i);
          if (oddity == 0) return ProcessDoNSFrame(ns, nullptr, count, out.data(), count);
          if (oddity == 1) return ProcessDoNSFrame(ns, in.data(), count, nullptr, count);
          if (oddity == 2) return ProcessDoNSFrame(nullptr, in.data(), count, out.data(), count);
          if (oddity == 3) return ProcessDoNSFrame(ns, in.data(), count, out.data(), count + 1);
          if (oddity == 4) return ProcessDoNSFrame(ns, in.data(), -count, out.data(), -count);
          Pcm &result = microphones != 2 && oddity < 30 ? in : out;
          return ProcessDoNSFrame(ns, in.data(), count, result.data(), count);
        },
        [&] {
          judge.take(out, ns->pcmDumpEnabled, ns->rateMode, ns->micCount, ns->reserved,
                     ns->processedSamples, ns->abnormalCheckCount);
          take_record(judge, ns->suppressor);
        });
    judge.take(FreeMemoryNS(ns));
    observer.take_dumps();
  });
}

TEST(Digests, OneMicrophone) {
  Judge judge("one_microphone");
  const Pcm speech = speech_16k(kSentences[4]);
  run(judge, "sentence", speech, 0, 1, Caller(1, false));
  run(judge, "sentence-strong", speech_16k(kSentences[1]), 2, 1, Caller(1, false));
  std::uint64_t seed = 100;
  for (const std::int32_t mode : {0, 2, 0, 2, 1000, 2000, 3002, -1000}) {
    ++seed;
    run(judge, "hostile-" + std::to_string(seed) + "-mode" + std::to_string(mode),
        hostile_signal(seed, 100000, speech), mode, 1, Caller(seed));
  }
  run(judge, "no-microphone", speech, 0, 3, Caller(3));
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
  judge.sequence("counters", [&] {
    Observer observer(judge);
    NsInstance *ns = InitializeDoNS(0, 1, 0);
    for (int i = 0; i < 4; ++i) {
      Pcm frame(160, 1000);
      judge.take(ProcessDoNSFrame(ns, frame.data(), 160, frame.data(), 160), frame);
      take_record(judge, ns->suppressor);
      judge.call();
      if (i > 0) continue;  // the first frame has set the noise
      ns->processedSamples = INT32_MAX - 200;
      ns->suppressor.frame_cnt = INT16_MAX - 1;
    }
    FreeMemoryNS(ns);
  });
  judge.sequence("refusals", [&] {
    Observer observer(judge);
    judge.take(without_memory([] { return InitializeDoNS(2, 1, 0) == nullptr; }));
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

Pcm interleaved(const Pcm &first, const Pcm &second) {
  Pcm pairs;
  for (std::size_t i = 0; i < first.size(); ++i) {
    pairs.push_back(first[i]);
    pairs.push_back(second[i]);
  }
  return pairs;
}

/// Speech that reaches the second microphone later and weaker, under noise of their own.
Pcm pairs_of(const Pcm &speech) {
  Random random(7);
  Pcm first, second;
  for (std::size_t i = 0; i < speech.size(); ++i) {
    first.push_back(clipped(speech[i] + draw(random, -300, 300)));
    second.push_back(clipped((i < 3 ? 0 : 13 * speech[i - 3] / 16) + draw(random, -300, 300)));
  }
  return interleaved(first, second);
}

/// Straight into the two-microphone suppressor, whose record the flat interface hides. The portable
/// body gives the same bits as the one that this processor gets.
void run_two(Judge &judge, const std::string &name, const Pcm &pairs, std::int16_t frames = 1) {
  judge.sequence(name, [&] {
    Observer observer(judge);
    const auto state = std::make_unique<S2chnsState>(), portable = std::make_unique<S2chnsState>();
    const auto samples = static_cast<std::size_t>(frames * 2 * kHop);
    for (std::size_t at = 0; at + samples <= pairs.size(); at += samples) {
      Pcm out(samples, 1234), same = out;
      for (std::size_t i = 0; i < samples / 2; i += kHop)
        s2chns_frame_portable(*portable, &pairs[at + 2 * i], &same[i]);
      const auto count = static_cast<std::int16_t>(frames * kHop);
      judge.take(S2CHNSProcessNSFrame(*state, &pairs[at], out.data(), count), out);
      take_record(judge, *state);
      observer.call();
      EXPECT_TRUE(out == same && std::memcmp(state.get(), portable.get(), sizeof *state) == 0);
    }
  });
}

TEST(Digests, TwoMicrophones) {
  Judge judge("two_microphones");
  const Pcm speech = speech_16k(kSentences[1]);
  const Pcm pairs = pairs_of(speech);
  run(judge, "sentence", pairs, 0, 2, Caller(1, false));
  run_two(judge, "record", pairs);
  run_two(judge, "record-two-frames", cut(pairs, 0, 40000), 2);
  run_two(judge, "record-twins", interleaved(speech, speech));
  Pcm dying = pairs, quiet;
  for (std::size_t i = pairs.size() / 3 | 1; i < 2 * pairs.size() / 3; i += 2) dying[i] = 0;
  run_two(judge, "record-dying", dying);
  for (int i = 0; i < 60 * 160; ++i) {  // magnitudes that sum up to 1599, 1600 or 1601
    const int frame = i / 160, at = i % 160, sample = at == 0 ? 9 + frame % 3 : 10;
    quiet.push_back(static_cast<std::int16_t>((frame + at) % 3 == 0 ? -sample : sample));
    quiet.push_back(static_cast<std::int16_t>(at * frame % 100));
  }
  run_two(judge, "barely-audible", quiet);
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
    run(judge, "hostile-" + std::to_string(seed), hostile, 0, 2, Caller(seed));
    run_two(judge, "record-hostile-" + std::to_string(seed), hostile);
  }
  judge.sequence("edges", [&] {
    constexpr float kInfinity = std::numeric_limits<float>::infinity(), kNone = NAN;
    const auto state = std::make_unique<S2chnsState>();
    const float tail[] = {40000,         -40000.5F, 100000, 32766,     -32768,     2147483520.0F,
                          2147483648.0F, 3e9F,      -3e9F,  kInfinity, -kInfinity, kNone};
    std::ranges::copy(tail, state->overlap_tail);
    Pcm in(320), out(320);
    std::fill_n(in.rbegin(), 20, 1000);  // far from the samples in question
    judge.take(S2CHNSProcessNSFrame(*state, in.data(), out.data(), 160), out, S2CHNSFree());
    for (const float x : {-kInfinity, kInfinity, kNone, -10.0F, 10.0F, 1.0F})
      judge.take(SAFE_EXP(x), SAFE_SAP(x));
    const float from[] = {1, 2, 3, 4};
    for (const Word16 n : {0, -1, -32768, 1, 3}) {
      float to[] = {5, 6, 7, 8};
      buffercopy(from, to, n);
      judge.take(to);
      bufferreset(to, n);
      judge.take(to);
    }
    judge.call();
  });
  judge.sequence("gates", [&] {
    for (float x = -11; x <= 11; x += 0x1p-9F) judge.take(SAFE_EXP(x), SAFE_SAP(x / 4));
    judge.call();
  });
}

void run_dynamics(Judge &judge, const std::string &name, const Pcm &audio, std::int32_t rate_hz,
                  std::int32_t dump, Caller caller) {
  judge.sequence(name, [&] {
    Observer observer(judge);
    const std::int64_t handle = InitializeDRC(rate_hz, dump);
    const auto *drc = reinterpret_cast<const DrcInstance *>(static_cast<std::intptr_t>(handle));
    observer.watch(drc);
    observer.drive(
        audio, caller, 1500, 160, 4,  // the last frame is processed whole
        [&](std::int64_t oddity, Pcm &pcm, std::int32_t count) {
          if (oddity == 0) return ProcessDRC(handle, nullptr, count);
          if (oddity == 1) return ProcessDRC(0, pcm.data(), count);
          if (oddity == 2) return ProcessDRC(-1, pcm.data(), count);
          return ProcessDRC(handle, pcm.data(), oddity == 3 ? -count : count);
        },
        [&] {
          judge.take(drc->firstCallLogged, drc->pcmDumpEnabled, drc->loudRingIndex, drc->loudRing,
                     drc->samplingRate, drc->frameLength, drc->gainEnvelope, drc->outputScale,
                     drc->riseCoefficient, drc->fallCoefficient);
        });
    judge.take(FreeMemoryDRC(handle));
    observer.take_dumps();
  });
}

TEST(Digests, Dynamics) {
  Judge judge("dynamics");
  const Pcm speech = speech_16k(kSentences[1]);
  run_dynamics(judge, "sentence", speech, 16000, 0, Caller(1, false));
  run_dynamics(judge, "sentence-dumped", speech, 16000, 1, Caller(1, false));
  for (std::uint64_t seed = 300; seed < 306; ++seed)
    run_dynamics(judge, "hostile-" + std::to_string(seed), hostile_signal(seed, 100000, speech),
                 16000, seed % 3, Caller(seed));
  for (const std::int32_t rate_hz : {8000, 0, -16000})
    run_dynamics(judge, "rate-" + std::to_string(rate_hz), hostile_signal(310, 20000, speech),
                 rate_hz, 1, Caller(310));
  judge.sequence("refusals", [&] {
    Observer observer(judge);
    judge.take(without_memory([] { return InitializeDRC(16000, 0); }));
    observer.call();
    judge.take(FreeMemoryDRC(0));
    judge.take(FreeMemoryDRC(-1));
    observer.call();
  });
  judge.sequence("loud-samples", [&] {
    Observer observer(judge);
    for (const int rate_hz : {16000, 16001}) {
      for (const int loud : {9, 10, 11, 50, 51, 99, 100, 101}) {
        const std::int64_t handle = InitializeDRC(rate_hz, 0);
        for (int i = 0; i < 24; ++i) {
          Pcm frame(160, 5);
          if (i < 12) std::fill_n(frame.rbegin(), loud, loud % 2 == 0 ? 8193 : -8193);
          judge.take(ProcessDRC(handle, frame.data(), 160));
        }
        FreeMemoryDRC(handle);
        observer.call();
      }
    }
  });
  judge.sequence("gain-by-peak", [&] {
    Observer observer(judge);
    for (std::int32_t peak = 0; peak <= INT16_MAX; peak += 7) {
      const std::int64_t handle = InitializeDRC(16000, 0);
      Pcm pcm(160, static_cast<std::int16_t>(peak % 2 == 0 ? peak : -peak - 1));
      judge.take(ProcessDRC(handle, pcm.data(), 160), pcm.back());
      FreeMemoryDRC(handle);
      if (peak % 256 < 7) observer.call();
    }
  });
}

}  // namespace
}  // namespace orvalis::test
