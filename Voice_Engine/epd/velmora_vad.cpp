#include "Voice_Engine/epd/velmora_vad.h"

#include <algorithm>
#include <cmath>

#include "Voice_Engine/basic_op/block_scaling.h"
#include "Voice_Engine/channel/channel_plans.h"
#include "Voice_Engine/channel/fixed_fft_kernel.h"

namespace orvalis {
namespace {

constexpr Word16 kHeadroom = 2;
constexpr Word32 kLeastVoiceEnergy = 300000;
constexpr Word32 kFramesPerBlock = 25;
constexpr Word32 kMostBlocks = 6;

const ChannelPlan &plan_of(Word32 band) {
  return band == 0 ? kWideBandDetection : kNarrowBandDetection;
}

/// `level` raised to `score`. A level of 0 under a score of 0 has no power; its threshold is 0.
Word64 gate_threshold(Word64 level, float score) {
  const double logarithm = std::log10(static_cast<double>(level));
  const double threshold = std::pow(10.0, logarithm * static_cast<double>(score));
  return std::isnan(threshold) ? 0 : static_cast<Word64>(threshold);
}

/// Adds a voice frame to the gate's blocks; each complete block after the first moves its
/// threshold.
void learn_speech_level(VelmoraVadState &vad, float score) {
  if (vad.blk_count >= kMostBlocks) return;
  vad.blk_frames += 1;
  vad.blk_acc += vad.tot_enrg;
  if (vad.blk_frames != kFramesPerBlock) return;

  const Word64 mean = vad.blk_acc / kFramesPerBlock;
  const Word64 previous_mean = vad.blk_mean;
  vad.blk_frames = 0;
  vad.blk_acc = 0;
  vad.blk_count += 1;
  vad.blk_mean = mean;
  if (vad.blk_count < 2) return;
  vad.speech_level = std::max((previous_mean + mean) / 2, vad.speech_level);
  vad.energy_th = gate_threshold(vad.speech_level, score);
}

}  // namespace

void VelmoraVADInit(VelmoraVadState **state, Word32 band) {
  VelmoraVadState &vad = **state;
  std::fill_n(vad.overlap, plan_of(band).overlap, Word16{0});
  vad.pre_emp_mem = 0;
  vad.update_cnt = 0;
  vad.prev_shift = 0;
  vad.hyster_cnt = 0;
  vad.last_update_cnt = 0;
  vad.vad_frame_cnt = 0;
  vad.tot_enrg = 0;
  vad.first_frame = 1;
}

Word32 VelmoraVAD(Flags &flags, VelmoraVadState **state, const Word16 *frame, Word32 band) {
  VelmoraVadState &vad = **state;
  const ChannelPlan &plan = plan_of(band);
  if (vad.vad_frame_cnt != MAX_16) vad.vad_frame_cnt += 1;

  Word16 samples[kMostFrameSamples] = {};
  std::copy_n(frame, plan.frame_samples, samples);
  const Word16 shift = block_norm_AL(flags, samples, plan.frame_samples, kHeadroom);

  Word16 buffer[kMostTransformSize];
  assemble_frame(flags, plan, samples, shift, vad.prev_shift, vad.pre_emp_mem, vad.overlap, buffer);
  window_edges(flags, plan, buffer);
  // The flat part of this window is 32767, not 1: it takes one unit off samples beyond half scale.
  for (int i = plan.overlap; i < plan.frame_samples; ++i)
    buffer[i] = mult_r(flags, buffer[i], MAX_16);
  real_fft(flags, buffer, Direction::kForward, epd_transform_plan(band));

  ChannelState channels = channels_of(vad, vad.vad_frame_cnt);
  const ChannelFindings found = analyse_channels(flags, plan, channels, buffer, shift);
  vad.tot_enrg = found.unclamped_energy;
  if (vad.vad_frame_cnt <= plan.seeding_frames) {
    std::copy_n(vad.ch_enrg, plan.channels, vad.ch_enrg_init);
  }
  if (found.is_noise) track_noise(flags, plan, channels);
  vad.first_frame = 0;
  vad.vad_flag = !found.is_noise && found.total_energy >= kLeastVoiceEnergy;
  return vad.vad_flag;
}

Word32 processVelmoraVAD(Flags &flags, VelmoraVadState **state, const Word16 *frame,
                         const float *score, Word32 band) {
  VelmoraVadState &vad = **state;
  if (VelmoraVAD(flags, state, frame, band) == 0) return 0;
  learn_speech_level(vad, *score);
  return vad.energy_th <= vad.tot_enrg;
}

}  // namespace orvalis
