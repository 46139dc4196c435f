// Total-protein measurement: per lane, the stain inside a strip of the lane's (reduced) width
// over the frame's common vertical range, raw and above a rolling-ball (top-hat) background;
// the normalisation factor of a lane is its background-corrected total relative to the
// strongest lane of its frame.
#include <algorithm>
#include <cmath>
#include <cstdint>
#include <ctime>
#include <limits>

#include <opencv2/imgproc.hpp>

#include "common/checked.h"
#include "common/log.h"
#include "detector/BandLaneDetectionImpl.h"
#include "detector/normalization.h"

namespace viraduve {

int truncToInt(double value) {
  if (std::isnan(value)) return 0;
  if (value >= 2147483647.0) return std::numeric_limits<int>::max();
  if (value <= -2147483648.0) return std::numeric_limits<int>::min();
  return static_cast<int>(value);
}

PolygonSums sumInsideConvexPolygon(const cv::Mat& A, const cv::Mat& B,
                                   const cv::Point (&polygon)[4]) {
  CV_Assert(A.type() == CV_32FC1 && B.type() == CV_32FC1 && A.size() == B.size());
  int xmin = polygon[0].x, xmax = polygon[0].x, ymin = polygon[0].y, ymax = polygon[0].y;
  for (const cv::Point& p : polygon) {
    xmin = std::min(xmin, p.x);
    xmax = std::max(xmax, p.x);
    ymin = std::min(ymin, p.y);
    ymax = std::max(ymax, p.y);
  }
  // One pixel of margin guards the rounding of the edge walk; clipped to the image, each side
  // of the box is either clear of the polygon or the image border, so the fill clips as it
  // would on a full-size mask.
  PolygonSums sums;
  const int x0 = static_cast<int>(std::max<int64_t>(int64_t{xmin} - 1, 0));
  const int y0 = static_cast<int>(std::max<int64_t>(int64_t{ymin} - 1, 0));
  const int x1 = static_cast<int>(std::min<int64_t>(int64_t{xmax} + 1, A.cols - 1));
  const int y1 = static_cast<int>(std::min<int64_t>(int64_t{ymax} + 1, A.rows - 1));
  if (x0 > x1 || y0 > y1) return sums;

  cv::Mat mask = cv::Mat::zeros(y1 - y0 + 1, x1 - x0 + 1, CV_8UC1);
  cv::Point shifted[4];
  for (int i = 0; i < 4; ++i) shifted[i] = cv::Point(polygon[i].x - x0, polygon[i].y - y0);
  cv::fillConvexPoly(mask, shifted, 4, cv::Scalar(255.0), 8, 0);
  for (int r = 0; r < mask.rows; ++r) {
    const uchar* m = mask.ptr<uchar>(r);
    const float* a = A.ptr<float>(y0 + r) + x0;
    const float* b = B.ptr<float>(y0 + r) + x0;
    for (int c = 0; c < mask.cols; ++c) {
      if (m[c] == 0) continue;
      ++sums.pixels;
      sums.sumA += a[c];
      sums.sumB += b[c];
    }
  }
  return sums;
}

namespace {

struct LaneTotals {
  double volume = 0.0;
  double adjusted = 0.0;
  int pixels = 0;
};

// The lane's centre line extended to the vertical range and the strip around it, summed over
// S and R. A lane with y1 == y2 has no direction; it is taken as vertical at x1 instead of
// dividing by zero.
LaneTotals measureLane(const cv::Mat& S, const cv::Mat& R, const Lane2D& lane,
                       const VerticalRange& range, double widthRatio) {
  const double slope = lane.y2 == lane.y1 ? 0.0
                                          : (static_cast<double>(lane.x2) - lane.x1) /
                                                (static_cast<double>(lane.y2) - lane.y1);
  const int vy1 = static_cast<int>(range[0]);
  const int vy2 = static_cast<int>(range[1]);
  const int xTop = truncToInt((static_cast<double>(vy1) - lane.y1) * slope + lane.x1);
  const int xBottom = truncToInt((static_cast<double>(vy2) - lane.y1) * slope + lane.x1);
  logLine("x_top = ", xTop, ", x_bottom = ", xBottom);
  printLane2D(lane);

  const double half = lane.width * 0.5 * widthRatio;
  const cv::Point polygon[4] = {{truncToInt(xTop - half), vy1},
                                {truncToInt(xTop + half), vy1},
                                {truncToInt(xBottom + half), vy2},
                                {truncToInt(xBottom - half), vy2}};
  const PolygonSums sums = sumInsideConvexPolygon(S, R, polygon);
  LaneTotals totals;
  totals.pixels = sums.pixels;
  totals.volume = std::max(sums.sumA, 0.0);
  totals.adjusted = std::max(sums.sumB, 0.0);
  logLine("volume = ", totals.volume);
  logLine("adjustedVolume = ", totals.adjusted);
  return totals;
}

}  // namespace

void BandLaneDetectionImpl::computeAllNormFactor(
    const Image& image, const std::vector<VerticalRange>& verticalRanges,
    std::vector<std::vector<Lane2D>>& allBandlanes, int32_t rbRadius, double widthRatio,
    std::vector<std::vector<double>>& allNormFactor,
    std::vector<std::vector<double>>& allLaneVolume,
    std::vector<std::vector<double>>& allLaneBackgroundVolume,
    std::vector<std::vector<double>>& allLaneAdjustedVolume) {
  const std::clock_t start = std::clock();
  logLine("In computeAllNormFactor().");
  cv::Mat S;
  logLine("numOfFrame = ", allBandlanes.size());
  image.mat().convertTo(S, CV_32F, 1 / 65535.0, 0.0);
  logLine("widthRatio = ", widthRatio);
  logLine("rbRadius = ", rbRadius);

  const cv::Mat element =
      cv::getStructuringElement(cv::MORPH_RECT, cv::Size(2 * rbRadius + 1, 2 * rbRadius + 1),
                                cv::Point(rbRadius, rbRadius));
  cv::Mat R;
  cv::morphologyEx(S, R, cv::MORPH_TOPHAT, element, cv::Point(-1, -1), 1, cv::BORDER_CONSTANT,
                   cv::morphologyDefaultBorderValue());
  double minVal = 0.0;
  double maxVal = 0.0;
  cv::minMaxLoc(S, &minVal, &maxVal);
  logLine("src, max = ", maxVal, ", min = ", minVal);
  cv::minMaxLoc(R, &minVal, &maxVal);
  logLine("src_rb, max = ", maxVal, ", min = ", minVal);
  cv::threshold(R, R, 0.0, 1.0, cv::THRESH_TOZERO);
  cv::minMaxLoc(R, &minVal, &maxVal);
  logLine("src_rb after threshold, max = ", maxVal, ", min = ", minVal);

  S = S * 65535.0;
  R = R * 65535.0;
  const double count = static_cast<double>(S.total());
  logLine("src.rows = ", S.rows, ", src.cols = ", S.cols);
  logLine("src_rb.rows = ", R.rows, ", src_rb.cols = ", R.cols);
  logLine("src.mean = ", cv::sum(S)[0] / count);
  logLine("src_rb.mean = ", cv::sum(R)[0] / count);

  for (std::size_t f = 0; f < allBandlanes.size(); ++f) {
    const std::vector<Lane2D>& lanes = allBandlanes[f];
    const VerticalRange& range = at(verticalRanges, f);
    logLine("Vertical range of frame_", f, ": ", "y1 = ", range[0], ", ", "y2 = ", range[1]);

    std::vector<LaneTotals> totals;
    totals.reserve(lanes.size());
    for (std::size_t i = 0; i < lanes.size(); ++i) {
      logLine("iLane = ", i);
      totals.push_back(measureLane(S, R, lanes[i], range, widthRatio));
    }

    int maxNumOfPixel = 0;
    for (const LaneTotals& t : totals) maxNumOfPixel = std::max(maxNumOfPixel, t.pixels);
    logLine("maxNumOfPixel = ", maxNumOfPixel);

    // Scale every lane to the area of the largest mask. A mask without pixels (range outside
    // the image) has nothing to scale: it keeps volumes 0 and so gets the factor 1.0.
    std::vector<double> volumes;
    std::vector<double> adjusted;
    std::vector<double> backgrounds;
    for (const LaneTotals& t : totals) {
      double volume = 0.0;
      double adjust = 0.0;
      if (t.pixels > 0) {
        const double k = static_cast<double>(maxNumOfPixel) / t.pixels;
        adjust = t.adjusted * k;
        volume = t.volume * k;
      }
      volumes.push_back(volume);
      adjusted.push_back(adjust);
      backgrounds.push_back(std::max(volume - adjust, 0.0));
    }

    double maxLaneAdjustedVolume = 0.0;
    for (double a : adjusted) maxLaneAdjustedVolume = std::max(maxLaneAdjustedVolume, a);
    logLine("maxLaneAdjustedVolume = ", maxLaneAdjustedVolume);

    allLaneVolume.push_back(volumes);
    allLaneAdjustedVolume.push_back(adjusted);
    allLaneBackgroundVolume.push_back(backgrounds);

    std::vector<double> factors;
    for (std::size_t i = 0; i < volumes.size(); ++i) {
      logLine("volume = ", volumes[i]);
      logLine("adjusted volume = ", adjusted[i]);
      logLine("backgroud volume = ", volumes[i] - adjusted[i]);
      const double factor = (maxLaneAdjustedVolume > 0 && adjusted[i] > 0)
                                ? adjusted[i] / maxLaneAdjustedVolume
                                : 1.0;
      logLine("norm factor = ", factor);
      factors.push_back(factor);
    }
    allNormFactor.push_back(factors);
  }

  logLine("Out computeAllNormFactor().");
  logLine("Time taken: ", secondsSince(start));
}

}  // namespace viraduve
