#include "Voice_Engine/epd/velmora_vad.h"

#include <algorithm>
#include <cmath>

#include "Voice_Engine/channel/channel_plans.h"

namespace orvalis {
namespace {

constexpr Word32 kMinVoiceEnergy = 300000;
constexpr Word32 kFramesPerBlock = 25;
constexpr Word32 kMaxBlocks = 6;

const ChannelPlan &plan_of(Word32 band) {
  return band == 0 ? kWideBandDetection : kNarrowBandDetection;
}

/// `level` raised to `score`; 0 if both are 0, where the logarithm leaves no number.
Word64 gate_threshold(Word64 level, float score) {
  const double logarithm = std::log10(static_cast<double>(level));
  const double threshold = std::pow(10.0, logarithm * static_cast<double>(score));
  return std::isnan(threshold) ? 0 : static_cast<Word64>(threshold);
}

/// Adds a voice frame to the gate's current block; each complete block after the first moves the
/// threshold.
void learn_speech_level(VelmoraVadState &vad, float score) {
  if (vad.blk_count >= kMaxBlocks) return;
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

Word32 VelmoraVAD(Flags &flags, VelmoraVadState **state, const Word16 *frame, Word32 band,
                  EpdReasons &reasons) {
  VelmoraVadState &vad = **state;
  const ChannelPlan &plan = plan_of(band);
  if (vad.vad_frame_cnt != MAX_16) vad.vad_frame_cnt += 1;

  ChannelState channels = channels_of(vad, vad.overlap, vad.vad_frame_cnt);
  const ChannelFindings found = analyse_frame(flags, plan, channels, frame);
  vad.tot_enrg = found.unclamped_energy;
  if (vad.vad_frame_cnt <= plan.initial_noise_frames) {
    std::copy_n(vad.ch_enrg, plan.channels, vad.ch_enrg_init);
  }
  if (found.is_noise) track_noise(plan, channels);
  vad.first_frame = 0;
  vad.vad_flag = !found.is_noise && found.total_energy >= kMinVoiceEnergy;

  reasons.noise = found.is_noise;
  reasons.voiceMetric = found.voice_metric;
  reasons.voiceMetricThreshold = plan.metric_noise;
  reasons.spectralDeviation = found.deviation_q5;
  reasons.spectralDeviationThreshold = plan.deviation_voice;
  reasons.channelEnergy = found.total_energy;
  reasons.minChannelEnergy = kMinVoiceEnergy;
  reasons.energy = vad.tot_enrg;
  reasons.energyGate = vad.energy_th;
  return vad.vad_flag;
}

Word32 processVelmoraVAD(Flags &flags, VelmoraVadState **state, const Word16 *frame,
                         const float *score, Word32 band, EpdReasons &reasons) {
  VelmoraVadState &vad = **state;
  if (VelmoraVAD(flags, state, frame, band, reasons) == 0) return 0;
  learn_speech_level(vad, *score);
  reasons.energyGate = vad.energy_th;
  return vad.energy_th <= vad.tot_enrg;
}

}  // namespace orvalis
