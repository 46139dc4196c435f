// The measurement steps that the band, region and rolling-ball analyses share. Every step
// works on region views of the analysis images; nothing of image size is made per band.
#include "detector/measure.h"

#include <algorithm>
#include <cmath>
#include <cstdint>
#include <vector>

#include <opencv2/imgproc.hpp>

#include "detector/BandLaneDetectionImpl.h"
#include "viraduve/Exception.h"

namespace viraduve {

namespace {

// Width of the frame around a box whose mean is the box's local background.
constexpr int kLocalFrame = 5;

cv::Rect inclusiveRect(const ROI& r) { return cv::Rect(r.x1, r.y1, r.x2 - r.x1 + 1, r.y2 - r.y1 + 1); }

// Truncation toward zero, saturated to the int range so that absurd lane sizes stay defined.
int truncToInt(double v) {
  const double t = std::trunc(v);
  if (!(t > static_cast<double>(INT32_MIN))) return INT32_MIN;
  if (t >= static_cast<double>(INT32_MAX)) return INT32_MAX;
  return static_cast<int>(t);
}

}  // namespace

void prepareAnalysisImages(const Image& image, int background, int radius, cv::Mat& A,
                           cv::Mat& T) {
  // Each step rewrites its matrix in place: the scalings are exact (powers of two on 16-bit
  // values), so no full-size copy is needed between them. Fresh matrices first, so that data
  // the caller's headers shared is not written.
  A.release();
  T.release();
  image.mat().convertTo(A, CV_32F, 1.0, 0.0);
  A = A / 65536.0;
  if (background >= 1) A = cv::Scalar(1.0) - A;
  const cv::Mat element = cv::getStructuringElement(
      cv::MORPH_RECT, cv::Size(2 * radius + 1, 2 * radius + 1), cv::Point(radius, radius));
  cv::morphologyEx(A, T, cv::MORPH_TOPHAT, element, cv::Point(-1, -1), 1, cv::BORDER_CONSTANT,
                   cv::morphologyDefaultBorderValue());
  A = A * 65536.0;
  T = T * 65536.0;
}

double globalBackgroundRect(const cv::Mat& A, const ROI& gbRoi) {
  const cv::Rect rect = inclusiveRect(gbRoi);
  if (rect.width <= 0 || rect.height <= 0) {
    throw Exception(-4, "ERROR! Empty global background region",
                    "viraduve::BandLaneDetectionImpl::analyis", "DaduZerovoVur\\BandLaneDetection",
                    0);
  }
  const cv::Mat region = A(rect);
  std::vector<float> values;
  values.reserve(static_cast<std::size_t>(rect.area()));
  for (int r = 0; r < region.rows; ++r) {
    const float* row = region.ptr<float>(r);
    values.insert(values.end(), row, row + region.cols);
  }
  // The value one past the middle of the descending order; a rectangle of fewer than three
  // pixels has no such position, so its last value stands in. Only the value at that
  // position matters, so a partial selection gives what a full sort would.
  const std::size_t n = values.size();
  const std::size_t k = static_cast<std::size_t>(std::floor(static_cast<double>(n) * 0.5));
  const std::size_t index = std::min(k + 1, n - 1);
  std::nth_element(values.begin(), values.begin() + static_cast<std::ptrdiff_t>(index),
                   values.end(), [](float x, float y) { return x > y; });
  return static_cast<double>(values[index]);
}

double globalBackgroundCircle(const cv::Mat& A, const Circle& gbCircle) {
  const int64_t cx = gbCircle.x;
  const int64_t cy = gbCircle.y;
  const int64_t r = gbCircle.radius;
  const int64_t r2 = r * r;
  // Only the circle's bounding box (clipped to the image) can hold pixels inside it.
  const int64_t reach = r < 0 ? -r : r;
  const int rowBegin = static_cast<int>(std::max<int64_t>(cy - reach, 0));
  const int rowEnd = static_cast<int>(std::min<int64_t>(cy + reach, A.rows - 1));
  const int colBegin = static_cast<int>(std::max<int64_t>(cx - reach, 0));
  const int colEnd = static_cast<int>(std::min<int64_t>(cx + reach, A.cols - 1));
  double sum = 0.0;
  int64_t count = 0;
  for (int row = rowBegin; row <= rowEnd; ++row) {
    const float* p = A.ptr<float>(row);
    const int64_t dy = row - cy;
    for (int col = colBegin; col <= colEnd; ++col) {
      const int64_t dx = col - cx;
      if (dx * dx + dy * dy < r2) {
        sum += p[col];
        ++count;
      }
    }
  }
  if (count == 0) {
    throw Exception(-4, "ERROR! Global background circle holds no pixel",
                    "viraduve::BandLaneDetectionImpl::analyis", "DaduZerovoVur\\BandLaneDetection",
                    0);
  }
  return sum / static_cast<double>(count);
}

BoxMeasures measureBox(const cv::Mat& A, const cv::Mat& T, const ROI& box, double G) {
  const cv::Rect b = inclusiveRect(box);
  const cv::Mat AB = A(b);
  const cv::Mat TB = T(b);

  const int lx1 = std::max(box.x1 - kLocalFrame, 0);
  const int ly1 = std::max(box.y1 - kLocalFrame, 0);
  const int lx2 = std::min(box.x2 + kLocalFrame, A.cols - 1);
  const int ly2 = std::min(box.y2 + kLocalFrame, A.rows - 1);
  const cv::Mat AL = A(cv::Rect(lx1, ly1, lx2 - lx1 + 1, ly2 - ly1 + 1));

  const double sumAB = cv::sum(AB)[0];
  const double sumAL = cv::sum(AL)[0];
  const int areaAB = AB.rows * AB.cols;
  const int areaAL = AL.rows * AL.cols;
  // Mean of the frame around the box: NaN when the frame is empty (a box covering the image).
  const double bLoc = (sumAL - sumAB) / static_cast<double>(areaAL - areaAB);

  const cv::Mat BL = cv::max(AB - cv::Scalar(bLoc), 0.0);
  const cv::Mat BG = cv::max(AB - cv::Scalar(G), 0.0);

  BoxMeasures m;
  m.volume = sumAB;
  m.area = static_cast<double>(areaAB);
  m.density = m.volume / m.area;
  m.median_intensity = BandLaneDetectionImpl::computeMedian(AB);
  m.local_bg_volume = cv::sum(BL)[0];
  m.local_bg_density = m.local_bg_volume / m.area;
  m.rolling_bg_volume = cv::sum(TB)[0];
  m.rolling_bg_density = m.rolling_bg_volume / m.area;
  m.global_bg_volume = cv::sum(BG)[0];
  m.global_bg_density = m.global_bg_volume / m.area;
  return m;
}

float laneMaskSum(const cv::Mat& A, const Lane2D& lane) {
  const double half = lane.width * 0.5;
  const cv::Point corners[4] = {
      {truncToInt(lane.x1 - half), lane.y1},
      {truncToInt(lane.x1 + half), lane.y1},
      {truncToInt(lane.x2 + half), lane.y2},
      {truncToInt(lane.x2 - half), lane.y2},
  };
  int64_t minX = corners[0].x, maxX = corners[0].x, minY = corners[0].y, maxY = corners[0].y;
  for (const cv::Point& p : corners) {
    minX = std::min<int64_t>(minX, p.x);
    maxX = std::max<int64_t>(maxX, p.x);
    minY = std::min<int64_t>(minY, p.y);
    maxY = std::max<int64_t>(maxY, p.y);
  }
  // The filled polygon lies within its corners' bounding box; one pixel of margin guards the
  // rounding of the edge walk. Clipped to the image, every side of the box is either clear
  // of the polygon or the image's own border, so the fill clips exactly as it would on a
  // mask of image size (the fill is invariant under integer translation).
  constexpr int64_t kMargin = 1;
  const int bx1 = static_cast<int>(std::max<int64_t>(minX - kMargin, 0));
  const int by1 = static_cast<int>(std::max<int64_t>(minY - kMargin, 0));
  const int bx2 = static_cast<int>(std::min<int64_t>(maxX + kMargin, A.cols - 1));
  const int by2 = static_cast<int>(std::min<int64_t>(maxY + kMargin, A.rows - 1));
  if (bx1 > bx2 || by1 > by2) return 0.0f;

  cv::Mat mask = cv::Mat::zeros(by2 - by1 + 1, bx2 - bx1 + 1, CV_8U);
  cv::Point shifted[4];
  for (int i = 0; i < 4; ++i) shifted[i] = corners[i] - cv::Point(bx1, by1);
  cv::fillConvexPoly(mask, shifted, 4, cv::Scalar(255.0), cv::LINE_8, 0);

  // A holds whole numbers (16-bit intensities), so this double sum is exact in any order and
  // equals the sum over an image-size masked copy.
  double sum = 0.0;
  for (int r = 0; r < mask.rows; ++r) {
    const uchar* m = mask.ptr<uchar>(r);
    const float* a = A.ptr<float>(by1 + r) + bx1;
    for (int c = 0; c < mask.cols; ++c)
      if (m[c]) sum += a[c];
  }
  return static_cast<float>(sum);
}

}  // namespace viraduve
