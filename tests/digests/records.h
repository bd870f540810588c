// The state that detector and suppressor share, field by field.
#pragma once

#include "Voice_Engine/ns/s1chns.h"
#include "tests/digests/judge.h"

namespace orvalis::test {

inline void take_record(Judge &judge, const S1chnsState &ns) {
  judge.take(ns.frame_cnt, ns.first_frame, ns.gain_slope_q15, ns.init_mode, ns.pre_emp_mem,
             ns.de_emp_mem, ns.update_cnt, ns.hyster_cnt, ns.last_update_cnt, ns.ch_enrg_long_db,
             ns.min_gain_q21, ns.synthesis_overlap, ns.bin_gain_q15, ns.analysis_overlap,
             ns.ch_enrg, ns.ch_noise, ns.prev_shift);
}

}  // namespace orvalis::test
