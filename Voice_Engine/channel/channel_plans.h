// The plans of the channel analysis: the detector's two bands and the suppressor's one.
#pragma once

#include "Voice_Engine/channel/channel_analysis.h"

namespace orvalis {

extern const ChannelPlan kWideBandDetection;    ///< 16 kHz, 21 channels
extern const ChannelPlan kNarrowBandDetection;  ///< 8 kHz, 16 channels
extern const ChannelPlan kSuppression;          ///< 16 kHz, 20 channels up to bin 125

}  // namespace orvalis
