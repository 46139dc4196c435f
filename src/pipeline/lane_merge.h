// How the detection drivers combine the per-channel results of one frame.
#pragma once

#include <vector>

#include "viraduve/records.h"

namespace viraduve {
namespace ImageProcessing {

// The lanes of channel 0, with the bands that each further channel found in lane j appended
// to lane j in channel order. A further channel with fewer lanes raises std::out_of_range.
std::vector<Lane2D> mergeChannelLanes(const std::vector<std::vector<Lane2D>>& perChannel);

// Clamps every lane and band into frame: top-left corners raised to the frame's, bottom-right
// corners lowered to the frame's.
void clampLanesInto(std::vector<Lane2D>& lanes, const ROI& frame);

}  // namespace ImageProcessing
}  // namespace viraduve
