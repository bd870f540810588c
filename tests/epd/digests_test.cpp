// Every bit of an instance after every frame, against one file of expected values: the same on
// every processor, with every compiler and optimisation.
//
// A change that is meant to alter answers renews the file: ORVALIS_WRITE_DIGESTS=<file> makes the
// test write it instead.
#include <gtest/gtest.h>

#include <bit>
#include <cstdlib>
#include <fstream>
#include <type_traits>
#include <vector>

#include "Voice_Engine/epd/epd_instance.h"
#include "jni/orvalis.h"
#include "tests/support/recordings.h"
#include "tests/support/scripted_malloc.h"

namespace orvalis::test {
namespace {

/// FNV-1a over the bytes of numbers, low byte first.
class Digest {
public:
  template <class... Values>
  void take(const Values &...values) {
    (take_one(values), ...);
  }
  std::uint32_t value() const { return value_; }

private:
  template <class Value>
  void take_one(const Value &value) {
    if constexpr (std::is_array_v<Value>) {
      for (const auto &element : value) take_one(element);
    } else if constexpr (std::is_same_v<Value, float>) {
      take_one(std::bit_cast<Word32>(value));
    } else {
      for (auto rest = static_cast<std::uint64_t>(value), i = std::uint64_t{0}; i < sizeof value;
           ++i) {
        value_ = (value_ ^ (rest & 0xFF)) * 16777619U;
        rest >>= 8;
      }
    }
  }

  std::uint32_t value_ = 2166136261U;
};

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
std::vector<std::uint32_t> digests_of(const Pcm &pcm, Word32 mode) {
  const auto zeroed = ScriptedMalloc::filling(0);  // fields that the mode does not use count too
  SetLogSink([](int, const char *, const char *, void *) {}, nullptr);
  EpdInstance *epd = InitializeEPD(mode, 0);
  const Word32 frame = mode % 10000 == 1000 ? 80 : 160;
  std::vector<std::uint32_t> digests;
  for (std::size_t at = 0; at + static_cast<std::size_t>(frame) <= pcm.size();
       at += static_cast<std::size_t>(frame)) {
    const Word32 answer = ProcessEPDFrame(epd, &pcm[at], frame);
    digests.push_back(digest_of(*epd, answer));
  }
  FreeMemoryEPD(epd);
  SetLogSink(nullptr, nullptr);
  return digests;
}

TEST(Digests, AreTheSameEverywhere) {
  struct Case {
    const char *name;
    Pcm pcm;
    Word32 mode;
  };
  // The gain of 4 overdrives, and wraps.
  const Case cases[] = {{"sentence", speech_16k(kSentences[3]), 0},
                        {"overdriven", speech_16k("cards/005.wav"), 20000},
                        {"narrow", speech_8k("wav/hts1a.wav"), 1000},
                        {"narrow-quiet", speech_8k("wav/mmt1.wav"), 11000}};
  Overflow = Carry = ns_Overflow = ns_Carry = 0;
  const char *to_write = std::getenv("ORVALIS_WRITE_DIGESTS");
  std::ofstream written(to_write != nullptr ? to_write : "");
  std::ifstream expected(ORVALIS_DIGESTS);
  for (const Case &c : cases) {
    const auto digests = digests_of(c.pcm, c.mode);
    if (to_write != nullptr) {
      written << c.name << ' ' << std::dec << digests.size();
      for (std::size_t i = 0; i < digests.size(); ++i) {
        written << (i % 10 == 0 ? '\n' : ' ') << std::hex << digests[i];
      }
      written << '\n';
      continue;
    }
    std::string name;
    std::size_t frames = 0;
    expected >> name >> std::dec >> frames >> std::hex;
    ASSERT_EQ(name, c.name);
    ASSERT_EQ(frames, digests.size());
    for (std::size_t i = 0; i < frames; ++i) {
      std::uint32_t digest = 0;
      expected >> digest;
      ASSERT_EQ(digests[i], digest) << c.name << ", frame " << i;
    }
  }
  ASSERT_TRUE(to_write == nullptr || written.flush()) << to_write;
}

}  // namespace
}  // namespace orvalis::test
