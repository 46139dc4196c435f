// Band update inside given lanes: the bands of every lane marked for update are found again
// along the lane's own (possibly tilted) centre line, refined to the bright blob around the
// lane centre, and filtered; the lanes themselves stay as the caller drew them.
#include <algorithm>
#include <cmath>

#include <opencv2/imgproc.hpp>

#include "common/log.h"
#include "detector/BandLaneDetectionImpl.h"
#include "detector/detector_helpers.h"

namespace viraduve {

namespace {

// Centre line of a lane: column = y * k + b. A lane with y1 == y2 has no direction; it is
// taken as vertical through x1 so that no infinite slope reaches an integer conversion.
struct LaneLine {
  float k = 0.0f;
  float b = 0.0f;
  int centreAt(int y) const { return toPixel(roundf(y * k + b)); }
};

LaneLine lineOf(const Lane2D& lane) {
  LaneLine line;
  if (lane.y1 == lane.y2) {
    line.b = static_cast<float>(lane.x1);
    return line;
  }
  line.k = static_cast<float>(lane.x1 - lane.x2) / static_cast<float>(lane.y1 - lane.y2);
  line.b = lane.x1 - lane.y1 * line.k;
  return line;
}

// Median grey level (0..255) of the 8-bit form of an image region: the first level at which
// the cumulative histogram exceeds half the pixel count.
int medianGreyLevel(const cv::Mat& region) {
  cv::Mat grey;
  region.convertTo(grey, CV_8U, 255.0);
  const int channels[] = {0};
  const int histSize[] = {256};
  const float range[] = {0.0f, 256.0f};
  const float* ranges[] = {range};
  cv::Mat hist;
  cv::calcHist(&grey, 1, channels, cv::Mat(), hist, 1, histSize, ranges, true, false);
  const int half = static_cast<int>(grey.total()) / 2;
  double cumulative = 0.0;
  for (int level = 0; level < 256; ++level) {
    cumulative += hist.at<float>(level);
    if (cumulative > half) return level;
  }
  return 0;
}

// Profile of the mean edge strength across the lane, one value per image row.
void laneRowProfiles(const cv::Mat& gPlus, const cv::Mat& gMinus, const Lane2D& lane,
                     const LaneLine& line, cv::Mat& top, cv::Mat& bottom) {
  const int rows = gPlus.rows;
  const int cols = gPlus.cols;
  top = cv::Mat::zeros(rows, 1, CV_32F);
  bottom = cv::Mat::zeros(rows, 1, CV_32F);
  const float halfWidth = roundf(static_cast<float>(lane.width * 0.5));
  // Rows outside the image have no profile sample.
  const int yBegin = std::max(lane.y1, 0);
  const int yEnd = std::min(lane.y2, rows);
  for (int y = yBegin; y < yEnd; ++y) {
    const int xc = line.centreAt(y);
    if (xc < 0 || xc > cols - 1) continue;
    const int from = static_cast<int>(std::max(xc - halfWidth, 0.0f));
    const int to = static_cast<int>(std::min(xc + halfWidth, static_cast<float>(cols - 1)));
    if (from >= to) continue;
    const cv::Rect segment(from, y, to - from + 1, 1);
    top.at<float>(y) = static_cast<float>(cv::mean(gPlus(segment))[0]);
    bottom.at<float>(y) = static_cast<float>(cv::mean(gMinus(segment))[0]);
  }
}

std::vector<Peak> edgePeaks(const cv::Mat& profile) {
  cv::Mat smoothed;
  cv::GaussianBlur(dropBelowHalfMean(profile), smoothed, cv::Size(1, 3), 1.0, 0,
                   cv::BORDER_DEFAULT);
  std::vector<Peak> peaks;
  BandLaneDetectionImpl::findPeaks(smoothed, peaks);
  return peaks;
}

}  // namespace

void BandLaneDetectionImpl::detectBands(std::vector<Lane2D>& lanes, uint32_t channel,
                                        const ROI& frame, std::vector<Lane2D>& lanesOut) {
  logLine("In BandLaneDetectionImpl::detectBands().");
  lanesOut.clear();
  std::stable_sort(lanes.begin(), lanes.end(),
                   [](const Lane2D& a, const Lane2D& b) { return a.x1 < b.x1; });

  // Narrow images are used as they are; wide ones are smoothed against noise first.
  cv::Mat W;
  if (3 * img_norm_.cols < 2705)
    W = img_norm_;
  else
    cv::GaussianBlur(img_norm_, W, cv::Size(3, 3), 3.0, 0, cv::BORDER_DEFAULT);
  const int rows = W.rows;
  const int cols = W.cols;

  // Background level from the inner part of the frame. The frame may reach past the image
  // (the drivers pass it unclamped), so it is clamped first.
  const int fx1 = std::max(frame.x1, 0);
  const int fy1 = std::max(frame.y1, 0);
  const int fx2 = std::min(frame.x2, cols - 1);
  const int fy2 = std::min(frame.y2, rows - 1);
  cv::Rect inner(fx1, fy1, fx2 - fx1, fy2 - fy1);
  if (inner.width > 20 && inner.height > 20) {
    const int mx = static_cast<int>(0.1 * inner.width);
    const int my = static_cast<int>(0.1 * inner.height);
    inner = cv::Rect(inner.x + mx, inner.y + my, inner.width - 2 * mx, inner.height - 2 * my);
  }
  // A frame without pixels inside the image leaves the whole image as the background area.
  if (inner.width <= 0 || inner.height <= 0) inner = cv::Rect(0, 0, cols, rows);
  const double T = medianGreyLevel(W(inner)) / 255.0 * 0.9;
  logLine("median value of current ROI =  ", T);

  cv::Mat gy;
  cv::Sobel(W, gy, CV_32F, 0, 1, 3, 1.0, 0.0, cv::BORDER_DEFAULT);
  const cv::Mat element = cv::getStructuringElement(cv::MORPH_RECT, cv::Size(3, 3), cv::Point(1, 1));
  cv::Mat_<float> gPlus;
  cv::Mat_<float> gMinus;
  splitSigns(gy, gPlus, gMinus);
  cv::erode(gPlus, gPlus, element, cv::Point(-1, -1), 1, cv::BORDER_CONSTANT,
            cv::morphologyDefaultBorderValue());
  cv::erode(gMinus, gMinus, element, cv::Point(-1, -1), 1, cv::BORDER_CONSTANT,
            cv::morphologyDefaultBorderValue());

  const int n = static_cast<int>(lanes.size());
  for (int i = 0; i < n; ++i) {
    const Lane2D& lane = lanes[i];
    logLine("lane_", i, ", x1 = ", lane.x1, ", y1 = ", lane.y1, ", x2 = ", lane.x2,
            ", y2 = ", lane.y2, ", width = ", lane.width);
    const LaneLine line = lineOf(lane);
    const bool hasLeft = i > 0;
    const bool hasRight = i + 1 < n;
    const LaneLine leftLine = hasLeft ? lineOf(lanes[i - 1]) : LaneLine{};
    const LaneLine rightLine = hasRight ? lineOf(lanes[i + 1]) : LaneLine{};

    if (!lane.update_flag) {
      Lane2D kept = lane;
      kept.bands.clear();
      for (const Band2D& band : lane.bands)
        if (band.channel == channel) kept.bands.push_back(band);
      kept.mw = false;
      lanesOut.push_back(kept);
      logLine("upadte_flag = 0");
      continue;
    }

    const double hw = lane.width * 0.5;
    cv::Mat topProfile;
    cv::Mat bottomProfile;
    laneRowProfiles(gPlus, gMinus, lane, line, topProfile, bottomProfile);
    const std::vector<Edge> edges = mergeEdges(edgePeaks(topProfile), edgePeaks(bottomProfile));

    std::vector<Band2D> initial;
    for (std::size_t e = 0; e + 1 < edges.size(); ++e) {
      const Edge& top = edges[e];
      const Edge& bottom = edges[e + 1];
      if (top.type != 1 || bottom.type != -1) continue;
      const int height = bottom.position - top.position;
      if (!(height > 0 && height < image_.rows / 4)) continue;
      Band2D band;
      band.channel = channel;
      band.y1 = top.position - 1;
      band.y2 = bottom.position;
      band.x1 = std::max(toPixel(std::round(band.y1 * line.k + line.b - hw - 0.49)), 0);
      band.x2 = std::min(toPixel(std::round(band.y2 * line.k + line.b + hw + 0.49)), cols - 1);
      band.mw_b = false;
      band.lane_bg_volume = (top.value + bottom.value) * 0.5;
      if (band.x1 < band.x2) initial.push_back(band);
    }
    logLine("Initial deteced num of bands by edges in lane is ", initial.size());

    std::vector<Band2D> refined;
    const int count = static_cast<int>(initial.size());
    for (int j = 0; j < count; ++j) {
      const Band2D& ini = initial[j];
      logLine("i_band = ", j);
      logLine("band_temp.x1 = ", ini.x1, ", x2 = ", ini.x2, ", y1 = ", ini.y1, ", y2 = ", ini.y2);
      logLine("before refinement. ");
      const double s = ini.lane_bg_volume;

      // Weak edges count only next to a neighbour of similar strength.
      if (s < 0.01) {
        const bool previousSimilar = j > 0 && initial[j - 1].lane_bg_volume > 0.01 &&
                                     initial[j - 1].lane_bg_volume < 1.5 * s;
        const bool nextSimilar = j + 1 < count && initial[j + 1].lane_bg_volume > 0.01 &&
                                 initial[j + 1].lane_bg_volume < 1.5 * s;
        if (!previousSimilar && !nextSimilar) {
          logLine("band with weak edges, lane_bg_volume = ", s, " < ", 0.01);
          continue;
        }
      }

      const int h = (ini.y2 - ini.y1) < (ini.x2 - ini.x1) ? ini.y2 - ini.y1 : 0;
      logLine("height_offest = ", h);
      const int limitAbove = j > 0 ? initial[j - 1].y2 : lane.y1;
      const int limitBelow = j + 1 < count ? initial[j + 1].y1 : lane.y2;
      const int tIndex = std::max({ini.y1 - h, limitAbove, 0});
      const int bIndex = std::min({ini.y2 + h, limitBelow, rows - 1});
      if (!(tIndex < bIndex)) {
        logLine("t_index > = b_index");
        continue;
      }

      const int mr = static_cast<int>(std::round((ini.y1 + ini.y2) * 0.5));
      const int xc = line.centreAt(mr);
      int leftLimit = hasLeft ? leftLine.centreAt(mr) : 0;
      if (hasLeft && lanes[i - 1].x2 >= lane.x2) {
        logLine("strange lane (1)");
        logLine("lane_temp.x2 = ", lane.x2, ", lane_temp_pre.x2 = ", lanes[i - 1].x2);
        leftLimit = toPixel(std::trunc(xc - 2 * hw));
      }
      int rightLimit = hasRight ? rightLine.centreAt(mr) : cols - 1;
      if (hasRight && lane.x2 >= lanes[i + 1].x2) {
        logLine("strange lane (2)");
        logLine("lane_temp.x2 = ", lane.x2, ", lane_temp_next.x2 = ", lanes[i + 1].x2);
        rightLimit = toPixel(std::trunc(xc + 2 * hw));
      }
      const int cap = toPixel(roundf(static_cast<float>(2 * hw)));
      const int dl = std::min(static_cast<int>((xc - leftLimit) * 0.5), cap);
      const int dr = std::min(static_cast<int>((rightLimit - xc) * 0.5), cap);
      const int lIndex = std::max(xc - dl, 0);
      const int rIndex = std::min(xc + dr, cols - 1);
      if (lIndex >= rIndex) {
        logLine("l_index >= r_index");
        continue;
      }

      Band2D band = ini;
      cv::Mat window8;
      W(cv::Rect(lIndex, tIndex, rIndex - lIndex + 1, bIndex - tIndex + 1))
          .convertTo(window8, CV_8U, 255.0);
      cv::Mat binary;
      cv::threshold(window8, binary, 0, 1.0, cv::THRESH_BINARY | cv::THRESH_OTSU);
      std::vector<std::vector<cv::Point>> contours;
      std::vector<cv::Vec4i> hierarchy;
      cv::findContours(binary, contours, hierarchy, cv::RETR_TREE, cv::CHAIN_APPROX_SIMPLE);
      if (contours.empty()) {
        logLine("empty contour");
      } else {
        double largest = 0.0;
        cv::Rect box(0, 0, 0, 0);
        for (const std::vector<cv::Point>& contour : contours) {
          const double area = cv::contourArea(contour);
          if (area > largest) {
            largest = area;
            box = cv::boundingRect(contour);
          }
        }
        band.x1 = std::max(lIndex - 1 + box.x, 0);
        band.y1 = std::max(tIndex - 1 + box.y, 0);
        band.x2 = std::min(lIndex + box.x + box.width + 1, cols - 1);
        band.y2 = std::min(tIndex + box.y + box.height + 1, rows - 1);
        if (xc < band.x1 || band.x2 < xc) {
          logLine("band_temp.x1 > x_center || band_temp.x2 < x_center, x_center = ", xc);
          band.y1 = ini.y1;
          band.y2 = ini.y2;
          band.x1 = std::max({static_cast<int>(xc - (xc - leftLimit) * 0.5), ini.x1, 0});
          band.x2 = std::min({static_cast<int>(xc + (rightLimit - xc) * 0.5), ini.x2, cols - 1});
        }
      }
      // Crossing neighbour lanes can leave no column between the limits.
      if (band.x2 < band.x1 || band.y2 < band.y1) continue;

      band.lane_bg_volume =
          BandLaneDetectionImpl::computeMedian(W(cv::Rect(band.x1, band.y1, band.x2 - band.x1 + 1, band.y2 - band.y1 + 1))) -
          T;
      logLine("band_temp.x1 = ", band.x1, ", x2 = ", band.x2, ", y1 = ", band.y1,
              ", y2 = ", band.y2);
      logLine("lane_bg_volume = ", band.lane_bg_volume);
      logLine("after refinement. ");
      refined.push_back(band);
    }

    Lane2D updated = lane;
    updated.bands = refined;
    updated.num_bands = static_cast<int32_t>(refined.size());
    updated.mw = false;
    lanesOut.push_back(updated);
    logLine("Finishe band detection in lane ", i + 1, " of ", n, " = ", refined.size());
  }
  logLine("Out BandLaneDetectionImpl::detectBands().");
}

void BandLaneDetectionImpl::filterBands(std::vector<Lane2D>& lanes, uint32_t /*channel*/) {
  logLine("In BandLaneDetectionImpl::filterBands().");
  for (std::size_t i = 0; i < lanes.size(); ++i) {
    Lane2D& lane = lanes[i];
    if (!lane.update_flag) continue;
    logLine("lane_", i, " is being filtered.");
    logLine("Num of bands before filtering at lane_", i, " = ", lane.bands.size());
    const int top = static_cast<int>(lane.y1 + 0.01 * (lane.y2 - lane.y1));
    const int bottom = static_cast<int>(lane.y2 - 0.01 * (lane.y2 - lane.y1));
    std::vector<Band2D>& bands = lane.bands;
    const std::size_t count = bands.size();
    int valid = 0;
    for (std::size_t j = 0; j < count; ++j) {
      Band2D& band = bands[j];
      if (band.y1 < top || band.y2 > bottom) {
        logLine("band_", j, " is too close to edge and rejected.");
        band.band_s_x = -1.0;
        continue;
      }
      const float ratio =
          static_cast<float>(band.y2 - band.y1) / static_cast<float>(band.x2 - band.x1);
      if (ratio > 1.2) {
        logLine("band_", j, " has a large height to width ratio and is rejected.");
        band.band_s_x = -2.0;
        continue;
      }
      // Overlapping neighbours are cut back to each other.
      const int u = j == 0 ? lane.y1 : bands[j - 1].y2;
      const int v = j + 1 == count ? lane.y2 : bands[j + 1].y1;
      band.y1 = std::max(band.y1, u);
      band.y2 = std::min(band.y2, v);
      if (band.lane_bg_volume < 0.001) {
        logLine("band_", j, " mean intensity is too low and is rejected.");
        logLine("lane_bg_volume = ", band.lane_bg_volume);
        band.band_s_x = -3.0;
      } else {
        band.band_s_x = 0.0;
        ++valid;
      }
    }
    logLine("Num of valid bands at lane_", i, " = ", valid);
  }
  if (lanes.empty()) {
    logLine("Out BandLaneDetectionImpl::filterBands(). ");
    return;
  }
  for (std::size_t i = 0; i < lanes.size(); ++i) {
    Lane2D& lane = lanes[i];
    if (!lane.update_flag) {
      logLine("lane_", i, " is unchanged.");
      continue;
    }
    logLine("Num of bands before filtering at lane_", i, " = ", lane.bands.size());
    std::vector<Band2D> kept;
    for (const Band2D& band : lane.bands) {
      if (band.lane_bg_volume >= 0.001 && band.band_s_x >= 0.0) {
        Band2D accepted = band;
        accepted.band_s_x = std::pow(band.lane_bg_volume, 0.2f);
        kept.push_back(accepted);
      }
    }
    lane.bands = kept;
    lane.update_flag = false;
    logLine("Num of bands after filtering at lane_", i, " = ", lane.bands.size());
  }
  logLine("Out BandLaneDetectionImpl::filterBands(). ");
}

}  // namespace viraduve
