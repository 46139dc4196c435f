// Internal pieces of the region measurement, reachable by the tests.
#pragma once

#include <cstdint>
#include <vector>

#include <opencv2/core.hpp>

#include "viraduve/records.h"

namespace viraduve {

// Measures a circle region on A (analysis image) and T (its top-hat), both CV_32F: the local
// background is the mean of the disc enlarged by 5 pixels (the region included); volumes over
// the pixels strictly inside the circle, the background corrections truncated per pixel.
// Only the part of the discs inside the image is visited.
void measureCircleRegion(const cv::Mat& A, const cv::Mat& T, double G, Region2D& region);

// Measures every region of the channel (rectangles as band boxes, circles as above), then
// sets the purity of each: its local_bg_volume over the channel's single-precision sum, or 0
// when that sum is below 0.0001 in magnitude.
void measureRegions(const cv::Mat& A, const cv::Mat& T, double G, uint32_t channel,
                    std::vector<Region2D>& regions);

}  // namespace viraduve
