// What the voice detector and the single-channel suppressor share: they pre-emphasise and transform
// a frame, compare the energy of its frequency channels with the noise estimate, and decide whether
// to update that estimate from the frame.
//
// Source: TIA IS-127 (EVRC), noise suppression: channel energy and SNR estimator, voice metric,
// spectral deviation estimator, noise update decision. Detector and suppressor extend it in
// different ways; the differences are data in ChannelPlan.
//
// Energies do not depend on the block shift of a frame: 256 is a bin of power 1. Levels are in dB
// relative to that, Q5.
#pragma once

#include "Voice_Engine/basic_op/flags.h"
#include "Voice_Engine/channel/fixed_fft_kernel.h"

namespace orvalis {

inline constexpr int kMaxChannels = 21;
inline constexpr int kPaddedChannels = 24;  ///< whole vectors of eight
inline constexpr int kMaxFrameSamples = 160;
inline constexpr int kMaxOverlap = 48;
inline constexpr int kMaxTransformSize = 256;

/// First and last bin of a channel, both included.
struct ChannelBins {
  Word16 first;
  Word16 last;
};

/// Division of the channels' powers by their widths: by a factor, or by a right shift where the
/// factor is 0.
struct ChannelScales {
  Word32 factor_q15[kPaddedChannels];
  Word32 shift[kPaddedChannels];
};

/// Sizes, tables and thresholds of one user of the analysis.
struct ChannelPlan {
  int channels;
  int frame_samples;
  int overlap;  ///< samples of the previous frame in front of this one
  const ChannelBins *bins;
  const ChannelScales *scales;
  const Word16 *window;  ///< in Q15, frame_samples + overlap values
  bool window_is_flat;   ///< 1 between the edges, where `window` is not read
  const TransformPlan *transform;
  Word32 energy_floor;
  int initial_noise_frames;    ///< frames at the start whose energies become the noise
  bool scale_then_smooth;      ///< undo the block shift before, not after, the product with 0.55
  Word16 alpha_high_level_q5;  ///< E_H: level from which the long-term alpha is at its maximum
  Word16 metric_noise;         ///< voice metric up to which a frame is noise
  Word32 energy_silent;        ///< total energy up to which no forced update is counted
  Word16 deviation_voice;      ///< spectral deviation from which a frame is voice
  bool remember_reset;         ///< hysteresis compares with update_cnt after its reset, not before
};

/// The part of a user's state record that the analysis works on.
struct ChannelState {
  Word32 *energy;
  Word32 *noise;
  Word16 *long_term_q5;
  Word16 *overlap;
  Word16 &pre_emp_mem;
  Word16 &prev_shift;
  Word16 &update_cnt;
  Word16 &hyster_cnt;
  Word16 &last_update_cnt;
  Word32 frame_cnt;
  bool first_frame;
};

/// The channel state inside a record whose fields have these names.
template <class Record>
inline ChannelState channels_of(Record &record, Word16 *overlap, Word32 frame_cnt) {
  return {.energy = record.ch_enrg,
          .noise = record.ch_noise,
          .long_term_q5 = record.ch_enrg_long_db,
          .overlap = overlap,
          .pre_emp_mem = record.pre_emp_mem,
          .prev_shift = record.prev_shift,
          .update_cnt = record.update_cnt,
          .hyster_cnt = record.hyster_cnt,
          .last_update_cnt = record.last_update_cnt,
          .frame_cnt = frame_cnt,
          .first_frame = record.first_frame == 1};
}

/// What one frame's analysis found.
struct ChannelFindings {
  Word16 shift;              ///< left shift that normalised the frame
  Word16 snr[kMaxChannels];  ///< channel SNR in steps of 3/8 dB, from 0
  Word16 voice_metric;
  Word16 deviation_q5;  ///< long-term spectral deviation, the sum over all channels
  Word32 total_energy;
  Word64 unclamped_energy;  ///< sum of the channel energies before their floor
  bool is_noise;            ///< IS-127's update_flag: the frame updates the noise

  bool operator==(const ChannelFindings &) const = default;
};

// --- Levels --------------------------------------------------------------------------------------

/// The 10 of 10 log10 in Q10, as IS-127 has it: 10.03, which is 0.3 % more than 10. Turns a log10
/// in Q26 into dB in Q21, whose high half is Q5.
inline constexpr Word16 kDecibels = 10270;

/// log10(2^23) in Q26: fnLog10 is relative to 2^31, log10_energy to 2^8.
inline constexpr Word32 kLog10Of2To23 = 464640964;

/// log10(energy / 256) in Q26.
Word32 log10_energy(Flags &flags, Word32 energy);

/// Level of an energy in dB, Q5.
Word16 level_q5(Flags &flags, Word32 energy);

Word32 sum_energies(Flags &flags, const Word32 *energy, int channels);

// --- The analysis --------------------------------------------------------------------------------

/// Alpha of the long-term levels, the weight of the past: 0.99 for loud frames, 0.5 for those that
/// are 20 dB quieter.
Word16 long_term_alpha_q15(Flags &flags, const ChannelPlan &plan, Word32 total);

/// The noise update decision. A spectrum that stays the same for 50 frames forces an update; the
/// hysteresis resets that count after 7 frames in which it stood still.
bool decide_noise(Flags &flags, const ChannelPlan &plan, ChannelState &state,
                  const ChannelFindings &found);

/// Normalises a frame of plan.frame_samples, puts the previous frame's overlap in front of it,
/// pre-emphasises, windows and transforms it. Updates energies, long-term levels and counters and,
/// in the first frames, the noise, which then is the channel energy, but at least 4096.
ChannelFindings analyse_frame(Flags &flags, const ChannelPlan &plan, ChannelState &state,
                              const Word16 *frame);

/// Updates the noise: 0.9 of the past and 0.1 of this frame. Leaves the flags as they are.
void track_noise(const ChannelPlan &plan, ChannelState &state);

}  // namespace orvalis
