// Rolling-ball lane background: a one-dimensional ball rolled under each lane's profile.
#pragma once

#include <string>
#include <vector>

#include <opencv2/core.hpp>

#include "viraduve/Image.h"
#include "viraduve/records.h"

namespace viraduve {
namespace CloudAnalysis {

struct RollingBallSetting {
  uint32_t channel = 0;
  uint32_t radius = 0;
};

void runRollingBallAnalysis(const std::string& imageDir,
                            std::vector<std::vector<Lane2D>>& framesLanes,
                            const std::vector<ImageParam>& imageParams, ImageMode imgMode,
                            const ROI& gbRoi, const std::vector<RollingBallSetting>& rollingBall);
void analyseLanesWithRollingBall(const Image& image, std::vector<Lane2D>& lanes, uint32_t channel,
                                 const ROI& gbRoi, uint32_t radius);
// One value per row y1..y2 of the 8-bit image E: the lane's mean across its width.
std::vector<double> computeLaneProfile(const cv::Mat& E, const Lane2D& lane);
// The background under profile; ends at the last contact point.
std::vector<double> rollBall(const std::vector<double>& profile, int radius);
// Subtracts background inside the lane's strip of the 8-bit image R.
void subtractLaneBackground(cv::Mat& R, const Lane2D& lane, const std::vector<double>& background);

}  // namespace CloudAnalysis
}  // namespace viraduve
