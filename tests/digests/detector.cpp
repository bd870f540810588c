// The end-point detector: every field of the instance after every call.
#include "Voice_Engine/epd/epd_instance.h"
#include "tests/digests/observe.h"

namespace orvalis::test {
namespace {

void take_record(Judge &judge, const EpdInstance &epd) {
  const auto &[kepd, floor, vad] = std::tie(epd.kepd, epd.noise_floor, epd.vad);
  judge.take(epd.pcmDumpEnabled, epd.epdMode, epd.rateMode, epd.hangLogEnabled, epd.inputGainMode,
             epd.processedSamples, epd.abnormalCheckCount, epd.HANGframe, kepd.onset_cnt,
             kepd.pause_cnt, kepd.in_speech, kepd.long_speech, kepd.end_cnt, kepd.voiced_run,
             kepd.speech_frames, kepd.frame_cnt, kepd.EnergyTHscore, floor.noise_frames,
             floor.speech_frames_ne, floor.speech_energy, floor.energy_hist, floor.noise_energy,
             floor.speech_noise_ratio);
  take_record(judge, epd.suppressor);
  take_record(judge, epd.secondary_suppressor);
  judge.take(vad.vad_flag, vad.vad_frame_cnt, vad.ch_enrg, vad.ch_noise, vad.ch_enrg_init,
             vad.tot_enrg, vad.first_frame, vad.pre_emp_mem, vad.update_cnt, vad.overlap,
             vad.hyster_cnt, vad.last_update_cnt, vad.ch_enrg_long_db, vad.prev_shift,
             vad.blk_frames, vad.blk_count, vad.energy_th, vad.blk_acc, vad.blk_mean,
             vad.speech_level);
}

std::int32_t process(EpdInstance *epd, const std::int16_t *pcm, std::int32_t count,
                     std::int32_t type, Caller &caller) {
  const auto entry = caller.hostile ? draw(caller.random, 0, 3) : 3;
  return entry == 0   ? ProcessEPDFrameByCnttype(epd, pcm, count, type)
         : entry == 1 ? ProcessEPDFrameByMode(epd, pcm, count, type)
                      : ProcessEPDFrame(epd, pcm, count);
}

void run(Judge &judge, const std::string &name, const Pcm &audio, std::int32_t mode,
         std::int32_t dump, Caller caller) {
  judge.sequence(name, [&] {
    Observer observer(judge);
    EpdInstance *epd = InitializeEPD(mode, dump);
    observer.watch(epd);
    const std::int32_t frame = epd->rateMode == 0 ? 160 : 80;
    std::int32_t type = 0;
    observer.drive(
        audio, caller, static_cast<std::size_t>(8 * frame), frame, 6,
        [&](std::int64_t oddity, Pcm &chunk, std::int32_t count) {
          if (oddity == 0) return ResetEPDparams(epd);
          if (oddity == 1) return setLogging(epd, 1);
          if (oddity == 2) return process(epd, nullptr, count, type, caller);
          if (oddity == 3) return process(epd, nullptr, 0, type, caller);
          if (oddity == 4) return process(nullptr, chunk.data(), count, type, caller);
          if (oddity == 5) return process(epd, chunk.data(), -count, type, caller);
          if (oddity == 11) type = pick(caller.random, {0, 1, 2, 3, -1, INT32_MAX});
          return process(epd, chunk.data(), count, type, caller);
        },
        [&] { take_record(judge, *epd); });
    judge.take(FreeMemoryEPD(epd));
    observer.take_dumps();
  });
}

/// The reasons of every frame, and that asking for them changes no decision.
void run_explained(Judge &judge, const std::string &name, const Pcm &audio, std::int32_t mode,
                   std::int32_t type) {
  judge.sequence(name, [&] {
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
                 why.channelEnergy, why.minChannelEnergy, why.energy, why.energyGate,
                 why.noiseFloor, why.onset, why.onsetFrames, why.pause, why.pauseFrames);
      judge.call();
      ProcessEPDFrameByCnttype(unasked, &audio[at], count, type);
      at += static_cast<std::size_t>(count);
    }
    EXPECT_EQ(std::memcmp(&epd->kepd, &unasked->kepd, sizeof epd->kepd), 0);
    FreeMemoryEPD(epd);
    FreeMemoryEPD(unasked);
  });
}

TEST(Digests, Detector) {
  Judge judge("detector");
  const Caller calm(1, false);
  run(judge, "sentence", speech_16k(kSentences[3]), 0, 0, calm);
  run(judge, "overdriven", speech_16k("cards/005.wav"), 20000, 1, calm);
  run(judge, "narrow", speech_8k("wav/hts1a.wav"), 1000, 1, calm);
  run(judge, "narrow-quiet", speech_8k("wav/mmt1.wav"), 11000, 0, calm);

  const Pcm wide = speech_16k(kSentences[0]), narrow = speech_8k("wav/vk5qi.wav");
  int seed = 0;
  for (const std::int32_t mode :
       {0, 1000, 0, 1000, 10000, 20000, 11000, 21000, 2, 1003, 3004, 4, -1000, 9999999}) {
    ++seed;
    const bool is_narrow = mode / 1000 % 10 == 1;
    const auto drawn = static_cast<std::uint64_t>(seed);
    run(judge, "hostile-" + std::to_string(seed) + "-mode" + std::to_string(mode),
        hostile_signal(drawn, is_narrow ? 60000 : 120000, is_narrow ? narrow : wide), mode,
        seed % 3, Caller(drawn));
  }
  for (const std::int32_t mode : {0, 1000, 20000, 21000})
    for (const std::int32_t type : {0, 2})
      run_explained(judge, "reasons-mode" + std::to_string(mode) + "-type" + std::to_string(type),
                    hostile_signal(static_cast<std::uint64_t>(50 + mode / 1000 + type), 90000,
                                   mode % 10000 == 0 ? wide : narrow),
                    mode, type);

  judge.sequence("refusals", [&] {
    Observer observer(judge);
    {
      const auto exhausted = ScriptedMalloc::failing();
      judge.take(InitializeEPD(1002, 1) == nullptr);
    }
    observer.call();
    auto *const no_handle = reinterpret_cast<EpdInstance *>(std::intptr_t{-1});
    for (const auto answer : {FreeMemoryEPD(nullptr), FreeMemoryEPD(no_handle),
                              ResetEPDparams(nullptr), setLogging(nullptr, 1)})
      judge.take(answer);
    judge.take(std::string(GetVersion()));
    for (const std::size_t length : {1000, 200, 196, 197, 198, 199, 0})
      judge.take(SetDumpRoot(std::string(length, 'x').c_str()));
    observer.call();
  });
}

}  // namespace
}  // namespace orvalis::test
