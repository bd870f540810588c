// The table of one instruction set: everything that is compiled once for each.
#include "Voice_Engine/bodies/services.h"
#include "Voice_Engine/channel/channel_analysis_lanes.h"
#include "Voice_Engine/channel/fixed_fft_lanes.h"
#include "Voice_Engine/channel/frame_screening_lanes.h"
#include "Voice_Engine/drc/level_frame_lanes.h"
#include "Voice_Engine/ns/s1chns_lanes.h"

namespace orvalis::ORVALIS_BODY {

constinit const Services kServices = {
    .complex_fft = complex_fft,
    .real_fft = real_fft,
    .analyse_frame = analyse_frame,
    .track_noise = track_noise,
    .is_null_frame = is_null_frame,
    .s1chns_C = s1chns_C,
    .level_frame = level_frame,
};

}  // namespace orvalis::ORVALIS_BODY
