// Measurement steps shared by the band (lane) and region forms of the analysis and by the
// rolling-ball lane analysis.
#pragma once

#include <opencv2/core.hpp>

#include "viraduve/Image.h"
#include "viraduve/records.h"

namespace viraduve {

// A = decoded image as float / 65536 (inverted when background >= 1), T = its top-hat with a
// (2 radius + 1)-square rectangle (BORDER_CONSTANT), both multiplied back by 65536. A and T
// receive new matrices (any data they shared is left alone).
void prepareAnalysisImages(const Image& image, int background, int radius, cv::Mat& A,
                           cv::Mat& T);

// Global background from a rectangle (inclusive corners): the value at index
// min(floor(n / 2) + 1, n - 1) of its pixels sorted in descending order. An empty
// rectangle raises viraduve::Exception -4; a rectangle outside A raises OpenCV's region error.
double globalBackgroundRect(const cv::Mat& A, const ROI& gbRoi);
// Global background from a circle: the mean of A over the pixels strictly inside it.
// A circle that holds no pixel raises viraduve::Exception -4.
double globalBackgroundCircle(const cv::Mat& A, const Circle& gbCircle);

// The measures of one inclusive box (band or rectangle region).
struct BoxMeasures {
  double area = 0.0;
  double volume = 0.0;
  double density = 0.0;
  double median_intensity = 0.0;
  double local_bg_volume = 0.0;
  double local_bg_density = 0.0;
  double global_bg_volume = 0.0;
  double global_bg_density = 0.0;
  double rolling_bg_volume = 0.0;
  double rolling_bg_density = 0.0;
};
// Volume, area, median, local background from the 5-pixel frame around the box (clamped to
// the image), global background G, rolling volume from T. Works on region views only.
BoxMeasures measureBox(const cv::Mat& A, const cv::Mat& T, const ROI& box, double G);

// The sum of A inside the lane's parallelogram (width around the centre line, corners
// truncated toward zero, filled 8-connected like cv::fillConvexPoly), as a float. Only the
// lane's bounding box is visited; A must hold whole numbers (16-bit intensities, as every
// analysis image does) so that the double sum is exact whatever the summation order, and
// equal to cv::sum over an image-size masked copy.
float laneMaskSum(const cv::Mat& A, const Lane2D& lane);

}  // namespace viraduve
