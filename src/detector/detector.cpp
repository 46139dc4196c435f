// The detector object: construction, factory, and the lane-direction count.
#include <opencv2/core.hpp>

#include "detector/BandLaneDetectionImpl.h"

namespace viraduve {

BandLaneDetection::~BandLaneDetection() = default;

std::unique_ptr<BandLaneDetection> createBandLaneDetection() {
  return std::make_unique<BandLaneDetectionImpl>();
}

BandLaneDetectionImpl::BandLaneDetectionImpl() : background_(-1) {}

BandLaneDetectionImpl::~BandLaneDetectionImpl() = default;

namespace {

uint32_t countWithinAngle(const std::vector<Lane2D>& lanes, std::vector<Lane2D>& outside,
                          float minAngle, float maxAngle) {
  uint32_t count = 0;
  for (const Lane2D& lane : lanes) {
    const float angle = cv::fastAtan2(static_cast<float>(lane.y2 - lane.y1),
                                      static_cast<float>(lane.x2 - lane.x1));
    bool within = minAngle <= angle && angle <= maxAngle;
    if (!within && angle >= 180.0f) {
      const float folded = angle - 180.0f;
      within = minAngle <= folded && folded <= maxAngle;
    }
    if (within)
      ++count;
    else
      outside.push_back(lane);
  }
  return count;
}

}  // namespace

uint32_t BandLaneDetectionImpl::countLanesWithinAngle(const std::vector<Lane2D>& lanes,
                                                      std::vector<Lane2D>& outside,
                                                      float minAngle, float maxAngle) {
  return countWithinAngle(lanes, outside, minAngle, maxAngle);
}

uint32_t BandLaneDetectionImpl::countLanesWithinAngle2(const std::vector<Lane2D>& lanes,
                                                       std::vector<Lane2D>& outside,
                                                       float minAngle, float maxAngle) {
  return countWithinAngle(lanes, outside, minAngle, maxAngle);
}

}  // namespace viraduve
