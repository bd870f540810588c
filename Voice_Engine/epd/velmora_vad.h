// Channel-energy voice activity detector: is there voice in this 10 ms frame?
//
// The noise update decision of the TIA IS-127 noise suppressor turned into a detector: a frame is
// voice if it must not update the noise estimate. An adaptive energy gate follows.
#pragma once

#include "Voice_Engine/basic_op/flags.h"
#include "Voice_Engine/channel/channel_analysis.h"
#include "Voice_Engine/epd/epd_reasons.h"

namespace orvalis {

/// State of one detector, part of the EPD instance.
struct VelmoraVadState {
  Word32 vad_flag;                       ///< last decision before the energy gate, 0 or 1
  Word32 vad_frame_cnt;                  ///< frames processed, stops at 32767
  Word32 ch_enrg[kMaxChannels];          ///< smoothed channel energies
  Word32 ch_noise[kMaxChannels];         ///< channel noise energies
  Word32 ch_enrg_init[kMaxChannels];     ///< channel energies of the first 10 frames; not read
  Word64 tot_enrg;                       ///< sum of the frame's channel energies, before the floor
  Word16 first_frame;                    ///< 1 until the first frame is done
  Word16 pre_emp_mem;                    ///< last normalised sample
  Word16 update_cnt;                     ///< frames that count towards a forced noise update
  Word16 overlap[kMaxOverlap];           ///< last pre-emphasised samples, scaled by prev_shift
  Word16 hyster_cnt;                     ///< frames with unchanged update_cnt
  Word16 last_update_cnt;                ///< update_cnt of the previous frame
  Word16 ch_enrg_long_db[kMaxChannels];  ///< long-term channel levels, dB in Q5
  Word16 prev_shift;                     ///< block shift of the previous frame
  Word32 blk_frames;                     ///< voice frames in the current block of 25
  Word32 blk_count;                      ///< complete blocks, stops after 6
  Word64 energy_th;                      ///< minimum energy of the gate
  Word64 blk_acc;                        ///< sum of tot_enrg over the current block
  Word64 blk_mean;                       ///< mean tot_enrg of the last block
  Word64 speech_level;                   ///< speech energy, never decreases
};

/// Prepares a state for its first frame, except vad_flag and the gate. Band 0 is 16 kHz, any other
/// 8 kHz.
void VelmoraVADInit(VelmoraVadState **state, Word32 band);

/// Decides on one frame of 160 (band 0) or 80 samples: 1 for voice, else 0. `reasons` says why.
Word32 VelmoraVAD(Flags &flags, VelmoraVadState **state, const Word16 *frame, Word32 band,
                  EpdReasons &reasons);

/// The same behind the energy gate, whose threshold is the speech level raised to `score`.
Word32 processVelmoraVAD(Flags &flags, VelmoraVadState **state, const Word16 *frame,
                         const float *score, Word32 band, EpdReasons &reasons);

}  // namespace orvalis
