// What a frame of 10 ms costs in each service and in its parts.
#pragma once

namespace orvalis::bench {

void register_frame_costs();

}  // namespace orvalis::bench
