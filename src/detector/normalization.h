// Internal pieces of the total-protein measurement, reachable by the tests.
#pragma once

#include <opencv2/core.hpp>

namespace viraduve {

// static_cast<int> for values inside the int range (truncation toward zero); values beyond it
// saturate and NaN gives 0, instead of the undefined conversion.
int truncToInt(double value);

struct PolygonSums {
  int pixels = 0;
  double sumA = 0.0;
  double sumB = 0.0;
};

// The pixels that cv::fillConvexPoly(mask, polygon, 4, 255, 8-connected, shift 0) sets on a
// mask of A's size, and the sums of A and B (CV_32F, same size) over them. The mask only
// spans the polygon's bounding box clipped to the image: integer filling is translation
// invariant, so the pixels are those of a full-size mask.
PolygonSums sumInsideConvexPolygon(const cv::Mat& A, const cv::Mat& B,
                                   const cv::Point (&polygon)[4]);

}  // namespace viraduve
