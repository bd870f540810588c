// What the voice detector and the single-channel suppressor have in common: a frame of
// pre-emphasised samples, the energy of its frequency channels against a tracked noise energy, and
// the decision whether the noise may be learnt from it.
//
// Source: TIA IS-127 (EVRC), noise suppression. Both widen it in their own way: what differs is
// data in ChannelPlan, what is shared stands here once.
//
// Energies are in units that do not depend on the block shift of a frame. Levels in dB are Q5,
// relative to an energy of 256.
#pragma once

#include "Voice_Engine/basic_op/flags.h"
#include "Voice_Engine/channel/fixed_fft_kernel.h"

namespace orvalis {

inline constexpr int kMostChannels = 21;
inline constexpr int kMostFrameSamples = 160;
inline constexpr int kMostOverlap = 48;
inline constexpr int kMostTransformSize = 256;

/// First and last bin of a channel, both included.
struct ChannelBins {
  Word16 first;
  Word16 last;
};

/// Division of a channel's power by its width: a right shift, or a factor in Q15.
struct ChannelScale {
  enum Kind : Word16 { kMultiply = 0, kShift = 1 } kind;
  Word16 value;
};

/// Sizes, tables and thresholds of one user of the analysis.
struct ChannelPlan {
  int channels;
  int frame_samples;
  int overlap;  ///< samples of the previous frame that open the next one
  const ChannelBins *bins;
  const ChannelScale *scales;
  const Word16 *window_edge;  ///< rising edge in Q15, `overlap` values
  Word32 window_flat_q15;     ///< between the edges; 32768 is 1
  const TransformPlan *transform;
  Word32 energy_floor;
  int seeding_frames;      ///< first frames in which the noise follows the signal
  bool scale_then_smooth;  ///< undo the block shift before, not after, the product with 0.55
  Word16 loud_level_q5;    ///< level around which long-term smoothing slows down
  Word16 metric_noise;     ///< voice metric up to which a frame is noise
  Word32 energy_silent;    ///< total energy up to which nothing is learnt
  Word16 deviation_voice;  ///< spectral deviation from which a frame is voice
  bool remember_reset;     ///< hysteresis compares with the count after its reset
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

/// The analysed part of a state record whose other fields have the names of the channel analysis.
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
  Word16 shift;               ///< left shift that normalised the frame
  Word16 snr[kMostChannels];  ///< channel SNR in steps of 3/8 dB, from 0
  Word16 voice_metric;
  Word16 deviation_q5;
  Word32 total_energy;
  Word64 unclamped_energy;  ///< sum of the channel energies before their floor
  bool is_noise;            ///< the noise may be learnt from this frame
};

// --- Levels --------------------------------------------------------------------------------------

/// 10 log10 as IS-127 has it, 10.03 in Q10: turns a log10 in Q26 into dB in Q21, and its high half
/// into Q5.
inline constexpr Word16 kDecibels = 10270;

/// log10(energy / 256) in Q26.
Word32 log10_energy(Flags &flags, Word32 energy);

/// Level of an energy in dB, Q5.
Word16 level_q5(Flags &flags, Word32 energy);

Word32 sum_energies(Flags &flags, const Word32 *energy, int channels);

// --- The analysis --------------------------------------------------------------------------------

/// In the first frames the noise is whatever there is, but not less than 4096.
void seed_noise(const ChannelPlan &plan, ChannelState &state);

/// Share of the past in the long-term levels, Q15: 0.5 for loud frames, 0.99 for quiet ones.
Word16 long_term_share(Flags &flags, const ChannelPlan &plan, Word32 total);

/// Whether the noise may be learnt from a frame, with the counters that force it when the spectrum
/// stays the same for 50 frames, and the hysteresis that forgets a broken count.
bool decide_noise(Flags &flags, const ChannelPlan &plan, ChannelState &state,
                  const ChannelFindings &found);

/// Analyses a frame of plan.frame_samples: normalises it, puts the previous frame's overlap before
/// it, pre-emphasises, windows and transforms it to a `spectrum` of plan.transform->size values.
/// Updates energies, long-term levels and counters and, in the first frames, the noise.
ChannelFindings analyse_frame(Flags &flags, const ChannelPlan &plan, ChannelState &state,
                              const Word16 *frame, Word16 *spectrum);

/// Learns the noise from a frame: 0.9 of the past and 0.1 of the present.
void track_noise(Flags &flags, const ChannelPlan &plan, ChannelState &state);

}  // namespace orvalis
