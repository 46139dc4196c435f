// The total-protein request ("frameList") and the steps of the total-protein flow that pair
// it with the analysis frames. Internal; reachable by the tests.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include <json/json.h>

#include "viraduve/BandLaneDetection.h"
#include "viraduve/records.h"

namespace viraduve {
namespace api {

struct TpnRect {
  uint32_t x1 = 0;
  uint32_t x2 = 0;
  uint32_t y1 = 0;
  uint32_t y2 = 0;
};

struct TpnLane {
  std::string uid;
  TpnRect laneRoi;
};

struct TpnFrame {
  TpnRect analysisFrameRoi;
  std::string uid;
  uint32_t channel = 0;
  // From the first element of "normalizeLanes" ("laneVolTop"."y1", "laneVolBottom"."y2").
  VerticalRange verticalRange{{0, 0}};
  std::vector<TpnLane> normalizeLanes;
};

// Decodes the "frameList" array.
std::vector<TpnFrame> decodeTpnFrameList(const Json::Value& frameList);

// One working lane list per request frame: for every analysis frame whose rectangle matches
// the request frame's "analysisFrameRoi", its lanes in order, each appended once per
// "normalizeLanes" element whose "laneRoi" has the lane's x1, y1, x2, y2.
std::vector<std::vector<Lane2D>> buildWorkingFrames(const std::vector<ROI>& rois,
                                                    const std::vector<std::vector<Lane2D>>& lanes2d,
                                                    const std::vector<TpnFrame>& requestFrames);

// Results of one request frame: the measured lanes and, per lane, the four values.
struct TpnFrameResult {
  std::vector<Lane2D> lanes;
  std::vector<double> normFactor;
  std::vector<double> laneVolume;
  std::vector<double> laneBackgroundVolume;
  std::vector<double> laneAdjustedVolume;
};

// Every response lane with the coordinates of a measured lane takes its four values, and its
// bands become the measured lane's bands (merged into the existing CloudBand records by
// position, so their texts stay). Later results win.
void mergeTpnResults(const std::vector<TpnFrameResult>& results,
                     std::vector<std::vector<CloudLane>>& cloudLanes);

}  // namespace api
}  // namespace viraduve
