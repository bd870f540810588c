// What a frame of 10 ms costs, in the whole detector and in each of its parts.
#pragma once

namespace orvalis::bench {

void register_frame_costs();

}  // namespace orvalis::bench
