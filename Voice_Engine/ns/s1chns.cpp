#include "Voice_Engine/ns/s1chns.h"

#include <algorithm>

namespace orvalis {
Word32 S1CHNSInit(S1chnsState *state, Word16 mode) {
  S1chnsState &ns = *state;
  ns.frame_cnt = 0;
  ns.first_frame = 1;
  ns.gain_slope_q15 = 1638;
  ns.init_mode = mode;
  ns.min_gain_q21 = mode == 2   ? word32(0xFDB33333)
                    : mode == 3 ? word32(0xFF400000)
                                : word32(0xFE600000);
  ns.pre_emp_mem = 0;
  ns.de_emp_mem = 0;
  ns.update_cnt = 0;
  ns.hyster_cnt = 0;
  ns.last_update_cnt = 0;
  std::ranges::fill(ns.synthesis_overlap, Word16{0});
  std::ranges::fill(ns.bin_gain_q15, Word16{0});
  std::ranges::fill(ns.analysis_overlap, Word16{0});
  std::ranges::fill(ns.ch_enrg, 0);
  ns.prev_shift = 0;
  return 0;
}

}  // namespace orvalis
