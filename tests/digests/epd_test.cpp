// The end-point detector and everything under it, bit by bit.
#include "Voice_Engine/epd/epd_instance.h"
#include "jni/orvalis.h"
#include "tests/support/digest.h"
#include "tests/support/recordings.h"
#include "tests/support/scripted_malloc.h"

namespace orvalis::test {
namespace {

std::uint32_t digest_of(const EpdInstance &epd, Word32 answer) {
  Digest digest;
  digest.take(answer, Overflow, Carry, ns_Overflow, ns_Carry, epd.processedSamples,
              epd.abnormalCheckCount, epd.HANGframe);
  const KepdState &kepd = epd.kepd;
  digest.take(kepd.onset_cnt, kepd.pause_cnt, kepd.in_speech, kepd.long_speech, kepd.end_cnt,
              kepd.voiced_run, kepd.speech_frames, kepd.frame_cnt, kepd.EnergyTHscore);
  const NoiseFloorState &floor = epd.noise_floor;
  digest.take(floor.noise_frames, floor.speech_frames_ne, floor.speech_energy, floor.energy_hist,
              floor.noise_energy, floor.speech_noise_ratio);
  const S1chnsState &ns = epd.suppressor;
  digest.take(ns.frame_cnt, ns.first_frame, ns.pre_emp_mem, ns.de_emp_mem, ns.update_cnt,
              ns.hyster_cnt, ns.last_update_cnt, ns.ch_enrg_long_db, ns.synthesis_overlap,
              ns.bin_gain_q15, ns.analysis_overlap, ns.ch_enrg, ns.ch_noise, ns.prev_shift);
  const VelmoraVadState &vad = epd.vad;
  digest.take(vad.vad_flag, vad.vad_frame_cnt, vad.ch_enrg, vad.ch_noise, vad.ch_enrg_init,
              vad.tot_enrg, vad.first_frame, vad.pre_emp_mem, vad.update_cnt, vad.overlap,
              vad.hyster_cnt, vad.last_update_cnt, vad.ch_enrg_long_db, vad.prev_shift,
              vad.blk_frames, vad.blk_count, vad.energy_th, vad.blk_acc, vad.blk_mean,
              vad.speech_level);
  return digest.value();
}

/// One digest a frame of a recording.
Digests digests_of(const Pcm &pcm, Word32 mode) {
  const auto zeroed = ScriptedMalloc::filling(0);  // fields that the mode does not use count too
  SetLogSink([](int, const char *, const char *, void *) {}, nullptr);
  EpdInstance *epd = InitializeEPD(mode, 0);
  const Word32 frame = mode % 10000 == 1000 ? 80 : 160;
  Digests digests;
  for (std::size_t at = 0; at + static_cast<std::size_t>(frame) <= pcm.size();
       at += static_cast<std::size_t>(frame)) {
    const Word32 answer = ProcessEPDFrame(epd, &pcm[at], frame);
    digests.push_back(digest_of(*epd, answer));
  }
  FreeMemoryEPD(epd);
  SetLogSink(nullptr, nullptr);
  return digests;
}

TEST(Digests, OfTheDetectorAreTheSameEverywhere) {
  Overflow = Carry = ns_Overflow = ns_Carry = 0;
  ExpectedDigests file("epd.txt");
  file.expect("sentence", digests_of(speech_16k(kSentences[3]), 0));
  // A gain of 4 overdrives, and wraps.
  file.expect("overdriven", digests_of(speech_16k("cards/005.wav"), 20000));
  file.expect("narrow", digests_of(speech_8k("wav/hts1a.wav"), 1000));
  file.expect("narrow-quiet", digests_of(speech_8k("wav/mmt1.wav"), 11000));
}

}  // namespace
}  // namespace orvalis::test
