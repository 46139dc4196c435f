// Bands of the full detection: the typical band width of a frame, which scales every later
// threshold, and the bands of one candidate lane, found first by their top and bottom edges
// along a narrow strip and then confirmed by one convincing pair of side edges.
#include <algorithm>
#include <cmath>

#include <opencv2/imgproc.hpp>

#include "common/log.h"
#include "detector/BandLaneDetectionImpl.h"
#include "detector/detector_helpers.h"

namespace viraduve {

namespace {

// A 3 x 3 rectangle erosion of a column range, equal to the same columns of the whole
// image's erosion (the filter reads the neighbours outside the range), without eroding the
// whole frame for every lane.
cv::Mat erodeColumns(const cv::Mat& image, int left, int right) {
  const cv::Mat element = cv::getStructuringElement(cv::MORPH_RECT, cv::Size(3, 3), cv::Point(1, 1));
  cv::Mat eroded;
  cv::erode(image(cv::Rect(left, 0, right - left + 1, image.rows)), eroded, element,
            cv::Point(-1, -1), 1, cv::BORDER_CONSTANT, cv::morphologyDefaultBorderValue());
  return eroded;
}

// Row profile of one edge image inside the strip, ready for the peak finder.
std::vector<Peak> rowEdgePeaks(const cv::Mat& strip) {
  cv::Mat profile;
  cv::reduce(strip, profile, 1, cv::REDUCE_AVG);
  profile = cv::max(profile, 0.0);
  profile = dropBelowHalfMean(profile);
  cv::Mat smoothed;
  cv::GaussianBlur(profile, smoothed, cv::Size(1, 5), 2.0, 0, cv::BORDER_DEFAULT);
  std::vector<Peak> peaks;
  BandLaneDetectionImpl::findPeaks(smoothed, peaks);
  return peaks;
}

std::vector<Peak> columnEdgePeaks(const cv::Mat& profile) {
  cv::Mat smoothed;
  cv::GaussianBlur(dropBelowHalfMean(profile), smoothed, cv::Size(5, 1), 2.0, 0,
                   cv::BORDER_DEFAULT);
  std::vector<Peak> peaks;
  BandLaneDetectionImpl::findPeaks(smoothed, peaks);
  return peaks;
}

}  // namespace

void BandLaneDetectionImpl::computeBandWidth(int& bandWidth) {
  logLine("In BandLaneDetectionImpl::computeBandWidth().");
  cv::Mat S;
  cv::GaussianBlur(scaled_image_, S, cv::Size(7, 7), 2.0, 0, cv::BORDER_DEFAULT);
  cv::Mat S2;
  cv::GaussianBlur(S, S2, cv::Size(3, 3), 3.0, 0, cv::BORDER_DEFAULT);
  cv::Mat S8;
  S2.convertTo(S8, CV_8U, 255.0, 0.0);

  cv::Mat edges;
  cv::Canny(S8, edges, 12.75, 38.25, 3, false);
  const cv::Mat element = cv::getStructuringElement(cv::MORPH_RECT, cv::Size(3, 3), cv::Point(1, 1));
  cv::dilate(edges, edges, element, cv::Point(-1, -1), 1, cv::BORDER_CONSTANT,
             cv::morphologyDefaultBorderValue());
  cv::erode(edges, edges, element, cv::Point(-1, -1), 1, cv::BORDER_CONSTANT,
            cv::morphologyDefaultBorderValue());

  std::vector<std::vector<cv::Point>> contours;
  std::vector<cv::Vec4i> hierarchy;
  cv::findContours(edges, contours, hierarchy, cv::RETR_TREE, cv::CHAIN_APPROX_NONE);

  const int rows = scaled_image_.rows;
  const int cols = scaled_image_.cols;
  const int minConnectedPixel = rows / 50 + cols / 50;
  logLine("min_connected_pixel = ", minConnectedPixel);
  logLine("Num of total detected contours = ", contours.size());
  logLine("band_width_ = ", band_width_);
  if (contours.empty()) {
    logLine("contours.size < 1");
    logLine("band_width_ = ", band_width_);
    logLine("Out BandLaneDetectionImpl::computeBandWidth()");
    return;
  }

  std::vector<int> widths;
  for (const std::vector<cv::Point>& contour : contours) {
    if (minConnectedPixel > 0 && static_cast<int>(contour.size()) < minConnectedPixel) continue;
    std::vector<cv::Point> hull;
    cv::convexHull(contour, hull, false, true);
    const cv::RotatedRect rect = cv::minAreaRect(contour);
    const double hullArea = cv::contourArea(hull);

    double minX = hull[0].x, maxX = hull[0].x, minY = hull[0].y, maxY = hull[0].y;
    for (const cv::Point& p : hull) {
      minX = std::min(minX, static_cast<double>(p.x));
      maxX = std::max(maxX, static_cast<double>(p.x));
      minY = std::min(minY, static_cast<double>(p.y));
      maxY = std::max(maxY, static_cast<double>(p.y));
    }
    const double w = maxX - minX;
    const double h = maxY - minY;

    const float a = std::fabs(rect.angle);
    const float residue = std::fabs(a - roundf(a / 90) * 90);

    const bool isBand = hullArea / (rect.size.width * rect.size.height) > 0.5 && w * 1.1 > h &&
                        h * 10.0 > w && w > cols / 50 && cols / 1.5 > w && residue < 15.0;
    if (isBand) {
      const float longSide = std::max(rect.size.width, rect.size.height);
      widths.push_back(static_cast<int>(longSide));
      logLine("valid band width = ", longSide);
    }
  }

  logLine("Num of valid contours = ", widths.size());
  if (widths.empty()) {
    logLine("No valid contour is detected. band_width is set to 0.");
    bandWidth = 0;
    logLine("Out BandLaneDetectionImpl::computeBandWidth()");
    return;
  }
  logLine("band_widths.size() = ", widths.size());
  const int median = integerMedian(widths);
  logLine("Mediam width of all valid bands is used to estimate the band_width.");
  bandWidth = static_cast<int>(std::round(median * scale_factor_));
  logLine("After scale, band_width_: ", bandWidth);
  logLine("Out BandLaneDetectionImpl::computeBandWidth().");
}

void BandLaneDetectionImpl::initialFindBandsInOneLane(const Lane2D& lane,
                                                      std::vector<Band2D>& bands) {
  bands.clear();
  logLine("In BandLaneDetectionImpl::initialFindBandsInOneLane().");
  logLine("Matrix, type = ", Image::typeText(image_.type()), ", cols = ", image_.cols,
          ", rows = ", image_.rows);
  const int rows = image_.rows;
  const int cols = image_.cols;
  const int bw = band_width_;

  // Stage 1: top and bottom edges along a narrow strip through the lane centre.
  const int hw = static_cast<int>(bw * 0.2f);
  const int left = std::max(lane.x1 - hw, 0);
  const int right = std::min(lane.x1 + hw, cols - 1);
  if (left >= right) {
    logLine("In valid lane for band detection = ", lane.x1);
    logLine("Out BandLaneDetectionImpl::initialFindBandsInOneLane().");
    return;
  }
  const std::vector<Peak> tops = rowEdgePeaks(erodeColumns(grad_y_1, left, right));
  const std::vector<Peak> bottoms = rowEdgePeaks(erodeColumns(grad_y_2, left, right));
  const std::vector<Edge> edges = mergeEdges(tops, bottoms);

  const int margin = rows / 20;
  const int halfBand = static_cast<int>(std::round(0.5 * bw));
  std::vector<Band2D> stage1;
  for (std::size_t k = 0; k + 1 < edges.size(); ++k) {
    const Edge& top = edges[k];
    const Edge& bottom = edges[k + 1];
    if (top.type != 1 || bottom.type != -1) continue;
    const int height = bottom.position - top.position;
    if (!(height > 1 && height < rows / 4)) continue;
    const int centre = (top.position + bottom.position) / 2;
    if (!(centre > margin && centre < rows - margin)) continue;
    if (!(top.value + bottom.value > 0.01)) continue;
    Band2D band;
    band.x1 = lane.x1 - halfBand;
    if (band.x1 < 2) band.x1 = 1;
    band.x2 = std::min(lane.x1 + halfBand, cols);
    band.y1 = top.position;
    band.y2 = bottom.position;
    band.mw_b = false;
    band.lane_bg_volume = (top.value + bottom.value) * 0.5;
    stage1.push_back(band);
  }

  // Stage 2: each band must find one convincing pair of side edges in a wider strip.
  const int s = static_cast<int>(bw * 1.2f);
  const int xl = std::max(lane.x1 - s, 0);
  const int xr = std::min(lane.x1 + s, cols - 1);
  if (xl >= xr) {
    bands = stage1;
  } else {
    const int regionWidth = xr - xl + 1;
    for (Band2D& band : stage1) {
      const int y1 = std::max(band.y1, 0);
      const int y2 = std::min(band.y2, rows);
      if (y2 <= y1) continue;
      const cv::Rect region(xl, y1, regionWidth, y2 - y1);
      cv::Mat hA;
      cv::Mat hB;
      cv::reduce(grad_x_1(region), hA, 0, cv::REDUCE_AVG);
      cv::reduce(grad_x_2(region), hB, 0, cv::REDUCE_AVG);
      const cv::Mat L = cv::max(hA - hB, 0.0);
      const cv::Mat R = cv::max(hB - hA, 0.0);
      const std::vector<Peak> leftPeaks = columnEdgePeaks(L);
      const std::vector<Peak> rightPeaks = columnEdgePeaks(R);

      std::vector<EdgePair> pairs;
      for (const Peak& l : leftPeaks) {
        for (const Peak& r : rightPeaks) {
          if (!(l.position < r.position)) continue;
          EdgePair pair;
          pair.l = l.position;
          pair.r = r.position;
          pair.vl = l.value;
          pair.vr = r.value;
          pair.m = band.lane_bg_volume;
          pair.c = regionWidth / 2;
          pair.bw = static_cast<float>(bw);
          scoreEdgePair(pair);
          if (pair.score > 0) pairs.push_back(pair);
        }
      }
      std::stable_sort(pairs.begin(), pairs.end(),
                       [](const EdgePair& a, const EdgePair& b) { return a.score > b.score; });
      if (pairs.empty()) continue;
      if (pairs.size() >= 2 && pairs[0].score <= 1.2 * pairs[1].score) continue;
      const EdgePair& best = pairs[0];
      band.x1 = xl + best.l;
      band.x2 = xl + best.r;
      band.band_s_y = (best.vl + best.vr) * 0.5;
      if (band.band_s_y > 0.05) bands.push_back(band);
    }
  }
  logLine("initial detectd num of bands = ", bands.size());
  logLine("Out BandLaneDetectionImpl::initialFindBandsInOneLane.");
}

void BandLaneDetectionImpl::scoreEdgePair(EdgePair& pair) {
  pair.score = 0.0f;
  if (!(pair.l < pair.r)) return;
  const int w = pair.r - pair.l;
  const float bw = pair.bw;
  if (!(w <= 1.7 * bw && w >= 0.58 * bw)) return;
  const double tol = 0.05 * bw;
  if (!(pair.l + tol <= pair.c && pair.c <= pair.r - tol)) return;
  if (!(std::min(pair.vl, pair.vr) / std::max(pair.vl, pair.vr) >= 0.33)) return;
  if (!(pair.m / 10 <= pair.vl + pair.vr)) return;

  const double avg = (pair.vl + pair.vr) / 2;
  const float widthError = std::fabs(w - bw);
  const double score = std::exp(-widthError / (0.8 * bw)) *
                       (1 - std::fabs(avg - pair.m) / (avg + pair.m)) * (pair.vl + pair.vr) *
                       std::exp(-std::fabs((pair.l + pair.r) / 2.0 - pair.c) / (0.5 * bw));
  pair.score = static_cast<float>(score);
}

}  // namespace viraduve
