// The end-point detector: every field of the instance after every call, and both sides of its
// thresholds from records made for them.
#include "Voice_Engine/channel/channel_plans.h"
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
    judge.take(without_memory([] { return InitializeEPD(1002, 1) == nullptr; }));
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

TEST(Digests, DetectorEdges) {
  Judge judge("detector_edges");
  judge.sequence("noise-decision", [&] {  // on both sides of the thresholds of all plans
    Random random(60);
    for (int i = 0; i < 60000; ++i) {
      Word16 unused = 0, count = pick<Word16>(random, {0, 30, 48, 49, MAX_16 - 1, MAX_16});
      auto last = static_cast<Word16>(count - draw(random, -1, 1));
      auto calm = pick<Word16>(random, {0, 5, 6, 7, MAX_16});
      ChannelState state{nullptr, nullptr, nullptr, nullptr, unused, unused,
                         count,   calm,    last,    1000,    false};
      ChannelFindings found{};
      found.voice_metric = pick<Word16>(random, {42, 43, 45, 46, 68, 69});
      found.total_energy = pick(random, {252, 253, 256, 257, 320, 321});
      found.deviation_q5 = pick<Word16>(random, {895, 896, 1999, 2000});
      Flags flags;
      const ChannelPlan *plans[] = {&kWideBandDetection, &kNarrowBandDetection, &kSuppression};
      judge.take(decide_noise(flags, *plans[i % 3], state, found), count, last, calm,
                 flags.overflow);
    }
    judge.call();
  });

  judge.sequence("instances", [&] {
    Observer observer(judge);
    const struct {
      int mode, small, level, counted;  // small samples and their level
    } cases[] = {
        {3, 0, 0, 0},         {-3, 0, 0, 0},     {4, 0, 0, 0},          {2000, 0, 0, 0},
        {9002, 0, 0, 0},      {-11001, 0, 0, 0}, {21011, 0, 0, 0},      {INT32_MAX, 0, 0, 0},
        {INT32_MIN, 0, 0, 0}, {0, 119, -4, 0},   {0, 120, -4, 0},       {0, 120, 4, 0},
        {0, 119, 5, 0},       {0, 120, 5, 0},    {0, 0, 0, MAX_32 - 2}, {0, 0, 0, MAX_32}};
    for (const auto &[mode, small, level, counted] : cases) {
      EpdInstance *epd = InitializeEPD(mode, 0);
      observer.watch(epd);
      Pcm frame(160, 1000);
      std::fill_n(frame.begin(), small, static_cast<std::int16_t>(level));
      if (counted > 0) {
        ProcessEPDFrame(epd, frame.data(), 160);  // a first frame has set the noise
        epd->processedSamples = epd->kepd.frame_cnt = epd->HANGframe = counted;
        epd->noise_floor.noise_frames = counted;
        epd->vad.vad_frame_cnt = epd->suppressor.frame_cnt = counted - MAX_32 + MAX_16;
      }
      for (int i = 0; i < 3; ++i) judge.take(ProcessEPDFrame(epd, frame.data(), 160));
      take_record(judge, *epd);
      FreeMemoryEPD(epd);
      observer.call();
    }
  });
  judge.sequence("answers", [&] {
    for (const bool voiced : {true, false, true}) {
      KepdState kepd{};
      kepd.in_speech = 1;
      kepd.onset_cnt = kepd.speech_frames = kepd.frame_cnt = MAX_32;
      EpdReasons reasons{};
      judge.take(decide(kepd, voiced, 0, false, reasons));
      judge.take(kepd.onset_cnt, kepd.pause_cnt, kepd.speech_frames, kepd.frame_cnt);
      judge.call();
    }
  });
  judge.sequence("energy-gate", [&] {
    Word64 energy = 0;
    Random random(62);
    for (Word32 i = 0; i < 2048; ++i) {
      // In silence energies fall to 0.45 of themselves: small steps cross the least of voice.
      VelmoraVadState vad{}, *state = &vad;
      vad.ch_enrg[0] = 665600;
      vad.ch_enrg[1] = std::min(i, 1500);
      std::ranges::fill(vad.ch_noise, 100);
      vad.vad_frame_cnt = 100;
      vad.blk_frames = 24;
      vad.blk_count = i < 1500 ? 6 : pick(random, {0, 1, 5, 6});
      vad.blk_acc = pick<Word64>(random, {0, -energy, 25000000000000 - energy});
      vad.energy_th = pick<Word64>(random, {7, energy, energy + 1});
      const float score = pick(random, {0.84F, 0.0F});
      const Word16 silence[160] = {};
      Flags flags;
      EpdReasons reasons;
      judge.take(processVelmoraVAD(flags, &state, silence, &score, 0, reasons), vad.vad_flag,
                 vad.tot_enrg, vad.energy_th, vad.blk_frames, vad.blk_count, vad.blk_mean);
      if (i % 64 == 63) judge.call();
      energy = vad.tot_enrg;
    }
  });
  judge.sequence("absolute-energy", [&] {
    Pcm loud(320);
    for (std::size_t i = 0; i < 320; ++i) loud[i] = static_cast<std::int16_t>(INT16_MIN + 60 * i);
    for (const int mode : {-1, 0, 1, 2, 3}) judge.take(getAbsoluteEnergy(loud.data(), mode));
    EpdInstance *none = nullptr;
    judge.take(InitKEPD(&none));
    judge.call();
  });
}

}  // namespace
}  // namespace orvalis::test
