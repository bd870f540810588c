// The end-point detector: every field of the instance after every call.
#include "Voice_Engine/epd/epd_instance.h"
#include "tests/digests/observe.h"
#include "tests/digests/records.h"

namespace orvalis::test {
namespace {

void take_record(Judge &judge, const EpdInstance &epd) {
  judge.take(epd.pcmDumpEnabled, epd.epdMode, epd.rateMode, epd.hangLogEnabled, epd.inputGainMode,
             epd.processedSamples, epd.abnormalCheckCount, epd.HANGframe);
  const KepdState &kepd = epd.kepd;
  judge.take(kepd.onset_cnt, kepd.pause_cnt, kepd.in_speech, kepd.long_speech, kepd.end_cnt,
             kepd.voiced_run, kepd.speech_frames, kepd.frame_cnt, kepd.EnergyTHscore);
  const NoiseFloorState &floor = epd.noise_floor;
  judge.take(floor.noise_frames, floor.speech_frames_ne, floor.speech_energy, floor.energy_hist,
             floor.noise_energy, floor.speech_noise_ratio);
  take_record(judge, epd.suppressor);
  take_record(judge, epd.secondary_suppressor);
  const VelmoraVadState &vad = epd.vad;
  judge.take(vad.vad_flag, vad.vad_frame_cnt, vad.ch_enrg, vad.ch_noise, vad.ch_enrg_init,
             vad.tot_enrg, vad.first_frame, vad.pre_emp_mem, vad.update_cnt, vad.overlap,
             vad.hyster_cnt, vad.last_update_cnt, vad.ch_enrg_long_db, vad.prev_shift,
             vad.blk_frames, vad.blk_count, vad.energy_th, vad.blk_acc, vad.blk_mean,
             vad.speech_level);
}

std::int32_t judge_samples(EpdInstance *epd, const std::int16_t *pcm, std::int32_t count,
                           std::int32_t type, Random &random) {
  switch (draw(random, 0, 3)) {
    case 0:
      return ProcessEPDFrameByCnttype(epd, pcm, count, type);
    case 1:
      return ProcessEPDFrameByMode(epd, pcm, count, type);
    default:
      return ProcessEPDFrame(epd, pcm, count);
  }
}

/// Frame after frame, one at a time; or, if hostile, as no caller should.
void run(Judge &judge, const Pcm &audio, std::int32_t mode, std::int32_t dump, Caller caller) {
  auto &[random, hostile] = caller;
  Observer observer(judge);
  EpdInstance *epd = InitializeEPD(mode, dump);
  observer.watch(epd);
  const auto frame = static_cast<std::size_t>(epd->rateMode == 0 ? 160 : 80);
  std::int32_t type = 0;
  for (std::size_t at = 0; at + 8 * frame <= audio.size();) {
    Pcm chunk(audio.begin() + static_cast<long>(at),
              audio.begin() + static_cast<long>(at + 8 * frame));
    auto count = static_cast<std::int32_t>(frame);
    std::int32_t answer = 0;
    const auto oddity = hostile ? draw(random, 0, 63) : 63;
    if (hostile) observer.disturb_flags(random);
    if (oddity == 0) answer = ResetEPDparams(epd);
    if (oddity == 1) answer = setLogging(epd, 1);
    if (oddity == 2) answer = judge_samples(epd, nullptr, count, type, random);
    if (oddity == 3) answer = judge_samples(epd, nullptr, 0, type, random);
    if (oddity == 4) answer = judge_samples(nullptr, chunk.data(), count, type, random);
    if (oddity == 5) answer = judge_samples(epd, chunk.data(), -count, type, random);
    if (oddity >= 6) {
      if (oddity < 10) count *= static_cast<std::int32_t>(draw(random, 2, 7));
      if (oddity == 10) count += static_cast<std::int32_t>(draw(random, 1, 3 * count));
      if (oddity == 11) type = pick(random, {0, 1, 2, 3, -1, INT32_MAX});
      answer = hostile ? judge_samples(epd, chunk.data(), count, type, random)
                       : ProcessEPDFrame(epd, chunk.data(), count);
      at += static_cast<std::size_t>(count) / frame * frame;
    }
    judge.take(answer, chunk);
    take_record(judge, *epd);
    observer.call();
  }
  judge.take(FreeMemoryEPD(epd));
  observer.take_dumps();
}

/// The reasons of every frame, and that asking for them changes no decision.
void run_explained(Judge &judge, const Pcm &audio, std::int32_t mode, std::int32_t type) {
  Observer observer(judge);
  EpdInstance *epd = InitializeEPD(mode, 0);
  EpdInstance *unasked = InitializeEPD(mode, 0);
  const std::int32_t frame = epd->rateMode == 0 ? 160 : 80;
  for (std::size_t at = 0; at + 480 <= audio.size();) {
    const std::int32_t count = frame * static_cast<std::int32_t>(1 + at % 3);
    EpdReasons why;
    judge.take(ProcessEPDFrameExplained(epd, &audio[at], count, type, &why));
    judge.take(why.judged, why.answer, why.voice, why.noise, why.voiceMetric,
               why.voiceMetricThreshold, why.spectralDeviation, why.spectralDeviationThreshold,
               why.channelEnergy, why.minChannelEnergy, why.energy, why.energyGate, why.noiseFloor,
               why.onset, why.onsetFrames, why.pause, why.pauseFrames);
    judge.call();
    ProcessEPDFrameByCnttype(unasked, &audio[at], count, type);
    at += static_cast<std::size_t>(count);
  }
  EXPECT_EQ(std::memcmp(&epd->kepd, &unasked->kepd, sizeof epd->kepd), 0);
  FreeMemoryEPD(epd);
  FreeMemoryEPD(unasked);
}

TEST(Digests, Detector) {
  Judge judge("detector");
  judge.sequence("sentence", [&] {
    run(judge, speech_16k(kSentences[3]), 0, 0, {Random(1), false});
  });
  judge.sequence("overdriven", [&] {
    run(judge, speech_16k("cards/005.wav"), 20000, 1, {Random(1), false});
  });
  judge.sequence("narrow", [&] {
    run(judge, speech_8k("wav/hts1a.wav"), 1000, 1, {Random(1), false});
  });
  judge.sequence("narrow-quiet", [&] {
    run(judge, speech_8k("wav/mmt1.wav"), 11000, 0, {Random(1), false});
  });

  const Pcm wide = speech_16k(kSentences[0]);
  const Pcm narrow = speech_8k("wav/vk5qi.wav");
  const std::int32_t modes[] = {0,     1000, 0,    1000, 10000, 20000, 11000,
                                21000, 2,    1003, 3004, 4,     -1000, 9999999};
  int seed = 0;
  for (const std::int32_t mode : modes) {
    ++seed;
    judge.sequence("hostile-" + std::to_string(seed) + "-mode" + std::to_string(mode), [&] {
      const bool is_narrow = mode / 1000 % 10 == 1;
      const auto samples = static_cast<std::size_t>(is_narrow ? 60000 : 120000);
      run(judge,
          hostile_signal(static_cast<std::uint64_t>(seed), samples, is_narrow ? narrow : wide),
          mode, seed % 3, {Random(static_cast<std::uint64_t>(seed)), true});
    });
  }

  for (const std::int32_t mode : {0, 1000, 20000, 21000}) {
    const Pcm &speech = mode % 10000 == 0 ? wide : narrow;
    for (const std::int32_t type : {0, 2}) {
      judge.sequence("reasons-mode" + std::to_string(mode) + "-type" + std::to_string(type), [&] {
        const auto drawn = static_cast<std::uint64_t>(50 + mode / 1000 + type);
        run_explained(judge, hostile_signal(drawn, 90000, speech), mode, type);
      });
    }
  }

  judge.sequence("refusals", [&] {
    Observer observer(judge);
    {
      const auto exhausted = ScriptedMalloc::failing();
      judge.take(InitializeEPD(1002, 1) == nullptr);
    }
    observer.call();
    auto *const no_handle = reinterpret_cast<EpdInstance *>(std::intptr_t{-1});
    judge.take(FreeMemoryEPD(nullptr));
    judge.take(FreeMemoryEPD(no_handle));
    judge.take(ResetEPDparams(nullptr));
    judge.take(setLogging(nullptr, 1));
    judge.take(std::string(GetVersion()));
    for (const std::size_t length : {1000, 200, 196, 197, 198, 199, 0})
      judge.take(SetDumpRoot(std::string(length, 'x').c_str()));
    observer.call();
  });
}

}  // namespace
}  // namespace orvalis::test
