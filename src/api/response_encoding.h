// Response JSON: cereal's pretty JSON archive (4-space indent, shortest round-trip doubles,
// NaN and Infinity tokens).
#pragma once

#include <string>
#include <vector>

#include "viraduve/records.h"

namespace viraduve {
namespace api {

std::string encodeFrames(const std::vector<CloudFrameLanes>& frames);
std::string encodeRegions(const std::vector<CloudRegion>& regions);

// One CloudFrameLanes per frame: roi = cloudFrames[i], lanes = cloudLanes[i].
std::vector<CloudFrameLanes> buildFrameLanes(const std::vector<CloudFrame>& cloudFrames,
                                             const std::vector<std::vector<CloudLane>>& cloudLanes);

}  // namespace api
}  // namespace viraduve
