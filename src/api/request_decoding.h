// Decoders from request JSON to exchange and working records.
#pragma once

#include <vector>

#include <json/json.h>

#include "viraduve/records.h"

namespace viraduve {
namespace api {

void decodeImageParas(const Json::Value& paras, std::vector<CloudImageParam>& cloudParams,
                      std::vector<ImageParam>& params);
// One frame object (the value of "analysisFrame"); the four lists grow in step.
void decodeFrame(const Json::Value& frame, std::vector<ROI>& rois,
                 std::vector<std::vector<Lane2D>>& lanes2d, std::vector<CloudFrame>& cloudFrames,
                 std::vector<std::vector<CloudLane>>& cloudLanes);
// Only the frame fields of a frame object (CloudFrame and its ROI), no lanes.
void decodeFrameOnly(const Json::Value& frame, std::vector<ROI>& rois,
                     std::vector<CloudFrame>& cloudFrames);
// A root array of {"analysisFrame": frame object}.
void decodeFrameList(const Json::Value& array, std::vector<ROI>& rois,
                     std::vector<std::vector<Lane2D>>& lanes2d,
                     std::vector<CloudFrame>& cloudFrames,
                     std::vector<std::vector<CloudLane>>& cloudLanes);
void decodeRegions(const Json::Value& regionArray, std::vector<Region2D>& regions2d,
                   std::vector<CloudRegion>& cloudRegions);
std::vector<MarkerWeightMap> decodeMarkerWeights(
    const Json::Value& array, const std::vector<CloudFrame>& cloudFrames,
    const std::vector<std::vector<CloudLane>>& cloudLanes);

}  // namespace api
}  // namespace viraduve
