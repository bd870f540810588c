// Single-channel noise suppressor: one microphone at 16 kHz, frames of 160 samples.
//
// Source: TIA IS-127 (EVRC) noise suppression, widened to a 256-point real transform and 20
// channels up to bin 125 (7.8 kHz). The output is delayed by 48 samples.
#pragma once

#include "Voice_Engine/basic_op/flags.h"
#include "Voice_Engine/channel/channel_analysis.h"

namespace orvalis {

inline constexpr int kSuppressionChannels = 20;

/// State of one suppressor.
struct S1chnsState {
  Word32 frame_cnt;                              ///< frames processed, stops at 32767
  Word16 first_frame;                            ///< 1 until the first frame is done
  Word16 gain_slope_q15;                         ///< 1/20: from dB to log10 of the amplitude
  Word16 init_mode;                              ///< argument of S1CHNSInit
  Word16 pre_emp_mem;                            ///< last normalised input sample
  Word16 de_emp_mem;                             ///< last output sample
  Word16 update_cnt;                             ///< frames that count towards a forced update
  Word16 hyster_cnt;                             ///< frames with unchanged update_cnt
  Word16 last_update_cnt;                        ///< update_cnt of the previous frame
  Word16 ch_enrg_long_db[kSuppressionChannels];  ///< long-term channel levels, dB in Q5
  Word32 min_gain_q21;                           ///< gain floor in dB
  Word16 synthesis_overlap[96];                  ///< tail of the previous inverse transform
  Word16 bin_gain_q15[128];                      ///< gain of each bin; the top two stay 0
  Word16 analysis_overlap[kMaxOverlap];          ///< last pre-emphasised samples
  Word32 ch_enrg[kSuppressionChannels];          ///< smoothed channel energies
  Word32 ch_noise[kSuppressionChannels];         ///< channel noise energies
  Word16 prev_shift;                             ///< block shift of the previous frame
};

/// Prepares a state. `mode` sets the gain floor: 2 is -18.4 dB, 3 is -6 dB, any other -13 dB.
/// Returns 0.
Word32 S1CHNSInit(S1chnsState *state, Word16 mode);

/// Suppresses the noise of exactly 160 samples. `in` is overwritten with the output too, and may be
/// the same buffer as `out`.
void s1chns_C(Flags &flags, S1chnsState *state, Word16 *in, Word16 *out);

}  // namespace orvalis
