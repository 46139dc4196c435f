// Frame detection: the blob route first (except for visible light), else the edge route on a
// copy of the image scaled to about 300 pixels: cleaned, edge-detected, optionally
// de-rotated, its closed outlines' hulls filtered by area and shape, duplicates removed.
#include "framedetect/frame_detection.h"

#include <algorithm>
#include <cmath>
#include <cstdio>

#include <opencv2/imgcodecs.hpp>
#include <opencv2/imgproc.hpp>

#include "common/log.h"
#include "framedetect/roi_filter.h"

namespace viraduve {

namespace {

// Blackens every pixel of the rotated edge image that lies outside the extent of the
// unrotated working image (half sizes halfWidth x halfHeight), the white fill included.
// The polar angle comes from atan of dy / dx, not atan2: the test is symmetric under a half
// turn. At dx = 0 the quotient is +-inf (atan gives +-pi/2) or, at the centre, NaN, which
// fails both comparisons and keeps the pixel.
void maskOutsideRotatedExtent(cv::Mat& edges, float angleDegrees, int halfWidth,
                              int halfHeight) {
  const float cx = static_cast<float>(edges.cols / 2);
  const float cy = static_cast<float>(edges.rows / 2);
  const double turn = angleDegrees / 180.0 * CV_PI;
  for (int y = 0; y < edges.rows; ++y) {
    uchar* p = edges.ptr<uchar>(y);
    const float dy = static_cast<float>(y) - cy;
    for (int x = 0; x < edges.cols; ++x) {
      const float dx = static_cast<float>(x) - cx;
      const float r = std::sqrt(dx * dx + dy * dy);
      const float theta = std::atan(dy / dx);
      const double phi = theta + turn;
      if (std::fabs(r * std::sin(phi)) >= halfHeight ||
          std::fabs(r * std::cos(phi)) >= halfWidth) {
        p[x] = 0;
      }
    }
  }
}

void logFrames(const std::vector<ROI>& frames) {
  logLine(" --- Frame detection: the number of frames after filtering ROI is ", frames.size());
  for (std::size_t i = 0; i < frames.size(); ++i) {
    const ROI& f = frames[i];
    logLine("  --- frame ", i + 1, ": [", f.x1, ", ", f.y1, "], [", f.x2, ", ", f.y2, "]");
  }
}

void detectFramesByEdges(const cv::Mat& image, std::vector<ROI>& roiListOut,
                         float ratation_angle) {
  const int W = image.cols;
  const int H = image.rows;

  cv::Mat work;
  cv::blur(image, work, cv::Size(3, 3), cv::Point(-1, -1), cv::BORDER_DEFAULT);
  cv::normalize(work, work, 0, 255, cv::NORM_MINMAX, -1);
  const float scale_factor = 300.0f / static_cast<float>(std::max(W, H));
  cv::medianBlur(work, work, 3);
  cv::resize(work, work,
             cv::Size(static_cast<int>(W * scale_factor), static_cast<int>(H * scale_factor)), 0,
             0, cv::INTER_LINEAR);
  const double workingArea = double(work.cols) * work.rows;
  const float minArea = static_cast<float>(0.0625 * workingArea);
  const float maxArea = static_cast<float>(0.9375 * workingArea);

  // Top-hat removes the small bright details; what remains is the broad frame structure.
  const int k = std::max(work.rows, work.cols) / 100;
  const cv::Mat element =
      cv::getStructuringElement(cv::MORPH_RECT, cv::Size(2 * k + 1, 2 * k + 1), cv::Point(k, k));
  cv::Mat tophat;
  cv::morphologyEx(work.clone(), tophat, cv::MORPH_TOPHAT, element);
  cv::subtract(work, tophat, work);
  cv::medianBlur(work, work, 5);

  cv::Mat edges;
  cv::Canny(work, edges, 1000, 500, 5, false);
  logLine("After Canny, image.type: ", edges.type());
  logLine("ratation_angle: ", ratation_angle, " degree");

  if (std::fabs(ratation_angle) > 0.5f) {
    rotateImage(edges, edges, ratation_angle, 1);
    maskOutsideRotatedExtent(edges, ratation_angle, work.cols / 2, work.rows / 2);
  }

  cv::morphologyEx(edges, edges, cv::MORPH_CLOSE, cv::Mat::ones(3, 3, CV_8U));
  std::vector<std::vector<cv::Point>> contours;
  cv::findContours(edges, contours, cv::RETR_EXTERNAL, cv::CHAIN_APPROX_NONE, cv::Point(0, 0));
  std::vector<std::vector<cv::Point>> hulls(contours.size());
  for (std::size_t i = 0; i < contours.size(); ++i) {
    cv::convexHull(contours[i], hulls[i], false, true);
  }
  logLine("contours_all.size(): ", hulls.size());

  std::vector<std::vector<cv::Point>> kept;
  for (const auto& hull : hulls) {
    const double a = cv::contourArea(hull, false);
    if (a > minArea && a < maxArea) kept.push_back(hull);
  }
  computeFrameAngles(kept, cv::Size(edges.cols, edges.rows), 0.34906584f);
  logLine("scale_factor: ", scale_factor);
  logLine("contours.size(): ", kept.size());

  const int max_width = static_cast<int>(std::trunc(W * 19.0 / 20.0));
  const int max_height = static_cast<int>(std::trunc(H * 19.0 / 20.0));
  for (const auto& hull : kept) {
    const cv::Rect r = cv::boundingRect(hull);
    const int x1 = std::min(static_cast<int>(std::round(r.x / scale_factor)), W - 1);
    const int y1 = std::min(static_cast<int>(std::round(r.y / scale_factor)), H - 1);
    const int x2 = std::min(static_cast<int>(std::round((r.x + r.width) / scale_factor)), W - 1);
    const int y2 = std::min(static_cast<int>(std::round((r.y + r.height) / scale_factor)), H - 1);
    const int roi_width = x2 - x1;
    const int roi_height = y2 - y1;
    // Both sides 0 give 0 / 0 = NaN, which fails the shape test.
    const float roi_ratio_wh = static_cast<float>(std::min(roi_width, roi_height)) /
                               static_cast<float>(std::max(roi_width, roi_height));
    logLine("roi_ratio_wh: ", roi_ratio_wh);
    logLine("roi_width: ", roi_width);
    logLine("roi_height: ", roi_height);
    logLine("max_width: ", max_width);
    logLine("max_height: ", max_height);
    // Nearly the whole image is the capture's own border, not a frame.
    if (roi_ratio_wh > 0.3f && !(roi_width >= max_width && roi_height >= max_height)) {
      logLine("valid contour");
      roiListOut.push_back(ROI{x1, y1, x2, y2});
    }
  }
  if (roiListOut.empty()) roiListOut.push_back(ROI{0, 0, W - 1, H - 1});

  logLine("before filterROI, roi_list.size(): ", roiListOut.size());
  std::vector<ROI> filtered;
  filterROI(roiListOut, filtered);
  roiListOut = std::move(filtered);
  logFrames(roiListOut);
}

}  // namespace

void detectFrames(const cv::Mat& grey, std::vector<ROI>& roiListOut, float ratation_angle,
                  ImageMode mode) {
  CV_Assert(grey.empty() || grey.type() == CV_8UC1);
  logLine(" --- Frame detection: input image type is ", grey.type(), ", width ", grey.cols,
          ", height ", grey.rows);
  // Never written in place: the caller's matrix stays as it is.
  cv::Mat image;
  if (mode == ImageMode_Vis) {
    logLine("VIS");
    // Frames are dark on a light background under visible light; make them bright.
    if (!grey.empty()) cv::subtract(cv::Scalar::all(255), grey, image);
  } else {
    image = grey;
  }
  if (image.empty()) {
    logLine("image is not found\n");
    return;
  }
  roiListOut.clear();
  if (mode != ImageMode_Vis) {
    roiListOut = detectFramesByBlobs(image);
    if (!roiListOut.empty()) return;
  }
  detectFramesByEdges(image, roiListOut, ratation_angle);
}

void detectFrames(const std::vector<unsigned char>& imageBytes, std::vector<ROI>& roiListOut,
                  float ratation_angle, ImageMode mode) {
  const cv::Mat grey =
      imageBytes.empty() ? cv::Mat() : cv::imdecode(imageBytes, cv::IMREAD_GRAYSCALE);
  detectFrames(grey, roiListOut, ratation_angle, mode);
}

void rotateImage(const cv::Mat& src, cv::Mat& dst, float angleDegrees, int fillMode) {
  // 65536 saturates to the white of the image type.
  const double fill = fillMode == 1 ? 65536.0 : 0.0;
  const int rows = src.rows;
  const int cols = src.cols;
  const int d = static_cast<int>(std::sqrt(double(rows) * rows + double(cols) * cols));
  const int padR = (d - rows) / 2;
  const int padC = (d - cols) / 2;

  cv::Mat canvas(d, d, src.type(), cv::Scalar::all(fill));
  src.copyTo(canvas(cv::Rect(padC, padR, cols, rows)));
  const cv::Mat M = cv::getRotationMatrix2D(
      cv::Point2f(static_cast<float>(d * 0.5), static_cast<float>(d * 0.5)), angleDegrees, 1.0);
  cv::Mat rotated;
  cv::warpAffine(canvas, rotated, M, cv::Size(d, d), cv::INTER_CUBIC, cv::BORDER_CONSTANT,
                 cv::Scalar(fill, fill, fill, 0));

  const cv::Mat corners = (cv::Mat_<double>(3, 4) << padC, padC + cols, padC, padC + cols,  //
                           padR, padR, padR + rows, padR + rows,                            //
                           1, 1, 1, 1);
  const cv::Mat moved = M * corners;
  int left = cols, top = rows, right = 0, bottom = 0;
  for (int j = 0; j < 4; ++j) {
    const int x = static_cast<int>(moved.at<double>(0, j));
    const int y = static_cast<int>(moved.at<double>(1, j));
    left = std::min(left, x);
    right = std::max(right, x);
    top = std::min(top, y);
    bottom = std::max(bottom, y);
  }
  dst = rotated(cv::Rect(left, top, right - left, bottom - top)).clone();
}

std::vector<float> computeFrameAngles(const std::vector<std::vector<cv::Point>>& hulls,
                                      cv::Size imageSize, float maxAngle) {
  const int lastX = imageSize.width - 1;
  const int lastY = imageSize.height - 1;
  std::vector<float> angles;
  for (const auto& hull : hulls) {
    float totalLength = 0.0f;
    float weightedSum = 0.0f;
    const std::size_t n = hull.size();
    for (std::size_t i = 0; i < n; ++i) {
      const cv::Point& a = hull[i];
      const cv::Point& b = hull[(i + 1) % n];
      // Edges along the image border are cut by the image, not by the frame.
      if ((a.x == 0 && b.x == 0) || (a.x == lastX && b.x == lastX) || (a.y == 0 && b.y == 0) ||
          (a.y == lastY && b.y == lastY)) {
        continue;
      }
      const float dx = static_cast<float>(a.x - b.x);
      const float dy = static_cast<float>(a.y - b.y);
      const float length = std::sqrt(dx * dx + dy * dy);
      const float angle = dx == 0.0f ? 1.5707964f : std::atan(dy / dx);
      if (std::fabs(angle) <= maxAngle) {
        totalLength += length;
        weightedSum += angle * length;
      }
    }
    // No usable edge leaves 0 / 0: NaN, only printed.
    angles.push_back(weightedSum / totalLength);
  }
  logLine("Computed rotate angle for each frame:");
  char text[64];
  for (std::size_t i = 0; i < angles.size(); ++i) {
    std::snprintf(text, sizeof text, "frame[%lu], angle: %.3f", static_cast<unsigned long>(i),
                  static_cast<double>(angles[i]));
    logLine(text);
  }
  return angles;
}

}  // namespace viraduve
