// Dynamics control: every field after every call, and all of the buffer.
#include "Voice_Engine/drc/dynamics_control.h"
#include "tests/digests/observe.h"

namespace orvalis::test {
namespace {

void run(Judge &judge, const Pcm &audio, std::int32_t rate_hz, std::int32_t dump, Caller caller) {
  auto &[random, hostile] = caller;
  Observer observer(judge);
  const std::int64_t handle = InitializeDRC(rate_hz, dump);
  const auto *drc = reinterpret_cast<const DrcInstance *>(static_cast<std::intptr_t>(handle));
  observer.watch(drc);
  constexpr std::size_t kRoom = 1500;  // the last frame is processed whole
  for (std::size_t at = 0; at + kRoom <= audio.size();) {
    Pcm pcm(audio.begin() + static_cast<long>(at), audio.begin() + static_cast<long>(at + kRoom));
    std::int32_t count = 160;
    std::int32_t answer = 0;
    const auto oddity = hostile ? draw(random, 0, 63) : 63;
    if (hostile) observer.disturb_flags(random);
    if (oddity == 0) answer = ProcessDRC(handle, nullptr, count);
    if (oddity == 1) answer = ProcessDRC(0, pcm.data(), count);
    if (oddity == 2) answer = ProcessDRC(-1, pcm.data(), count);
    if (oddity == 3) answer = ProcessDRC(handle, pcm.data(), -count);
    if (oddity >= 4) {
      if (oddity < 10) count *= static_cast<std::int32_t>(draw(random, 2, 7));
      if (oddity == 10) count += static_cast<std::int32_t>(draw(random, 1, 3 * count));
      answer = ProcessDRC(handle, pcm.data(), count);
      at += static_cast<std::size_t>(count / 160 * 160);
    }
    judge.take(answer, pcm, drc->firstCallLogged, drc->pcmDumpEnabled, drc->loudRingIndex,
               drc->loudRing, drc->samplingRate, drc->frameLength, drc->gainEnvelope,
               drc->outputScale, drc->riseCoefficient, drc->fallCoefficient);
    observer.call();
  }
  judge.take(FreeMemoryDRC(handle));
  observer.take_dumps();
}

TEST(Digests, Dynamics) {
  Judge judge("dynamics");
  const Pcm speech = speech_16k(kSentences[1]);
  judge.sequence("sentence", [&] { run(judge, speech, 16000, 0, {Random(1), false}); });
  judge.sequence("sentence-dumped", [&] { run(judge, speech, 16000, 1, {Random(1), false}); });
  for (std::uint64_t seed = 300; seed < 306; ++seed) {
    judge.sequence("hostile-" + std::to_string(seed), [&] {
      run(judge, hostile_signal(seed, 100000, speech), 16000, seed % 3, {Random(seed), true});
    });
  }
  for (const std::int32_t rate_hz : {8000, 0, -16000}) {
    judge.sequence("rate-" + std::to_string(rate_hz), [&] {
      run(judge, hostile_signal(310, 20000, speech), rate_hz, 1, {Random(310), true});
    });
  }
  judge.sequence("refusals", [&] {
    Observer observer(judge);
    {
      const auto exhausted = ScriptedMalloc::failing();
      judge.take(InitializeDRC(16000, 0));
    }
    observer.call();
    judge.take(FreeMemoryDRC(0));
    judge.take(FreeMemoryDRC(-1));
    observer.call();
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
