// Lanes of the full detection: candidate centres from a column profile of band edges, the
// bands of each candidate, a line fit through them, and a final regularisation of the lane
// spacing (lanes inserted into large gaps, lanes crowding their left neighbour dropped).
#include <algorithm>
#include <cmath>
#include <cstdlib>
#include <limits>

#include <opencv2/imgproc.hpp>

#include "common/log.h"
#include "detector/BandLaneDetectionImpl.h"
#include "detector/detector_helpers.h"

namespace viraduve {

namespace {

bool byScoreDescending(const Band2D& a, const Band2D& b) { return a.band_s_y > b.band_s_y; }

int laneCentre(const Lane2D& lane) { return (lane.x1 + lane.x2) / 2; }

}  // namespace

void BandLaneDetectionImpl::detectLanes(std::vector<Lane2D>& lanes) {
  lanes.clear();
  logLine("In BandLaneDetectionImpl::detectLanes()");
  band_width_ = 0;
  computeBandWidth(band_width_);
  if (band_width_ == 0) {
    logLine("No band is found, so can not define a lane!!");
    logLine("Out BandLaneDetectionImpl::detectLanes().");
    return;
  }

  std::vector<Lane2D> lanesIni;
  initialDetectLanes(lanesIni);
  if (lanesIni.empty()) {
    logLine("Initial find num of lanes is zero in current frame!!");
    return;
  }
  logLine("After step 1, detected num of lanes = ", lanesIni.size());

  std::vector<Lane2D> fittedAll;
  std::vector<Lane2D> withBands;
  for (std::size_t i = 0; i < lanesIni.size(); ++i) {
    logLine("index_lane = ", i);
    Lane2D candidate = lanesIni[i];
    std::vector<Band2D> bands;
    initialFindBandsInOneLane(candidate, bands);
    logLine("Initial num of detected bands in lane_", i, " = ", bands.size());
    logLine("Fit lane_", i, " based on initial deteced bands.");
    candidate.bands = bands;
    Lane2D fitted;
    fitLaneBasedBands(candidate, fitted);
    fittedAll.push_back(fitted);
    if (!fitted.bands.empty()) {
      std::stable_sort(fitted.bands.begin(), fitted.bands.end(), byScoreDescending);
      withBands.push_back(fitted);
    }
  }
  logLine("After step 2, detected num of lanes = ", withBands.size());

  if (withBands.empty()) {
    logLine("detected lanes == 0. ");
  } else if (withBands.size() == 1) {
    logLine("detected lanes == 1. ");
    lanes = fittedAll;
  } else {
    refineLanesNew(withBands, lanes);
  }
  logLine("After step 3, detected num of lanes = ", lanes.size());
  logLine("Out BandLaneDetectionImpl::detectLanes(). ");
}

void BandLaneDetectionImpl::initialDetectLanes(std::vector<Lane2D>& lanesIni) {
  logLine("In BandLaneDetectionImpl::initialDetectLanes().");
  logLine("Initial lanes detection based on normed_image_(frame). ");
  logLine("cols = ", normed_image_.cols, ", rows = ", normed_image_.rows);
  double minVal = 0.0;
  double maxVal = 0.0;
  cv::minMaxLoc(normed_image_, &minVal, &maxVal);
  logLine("min = ", minVal, ", max = ", maxVal);
  logLine("Apply Gaussian smooth to current frame.");

  const int bw = band_width_;
  cv::Mat G;
  cv::GaussianBlur(normed_image_, G, cv::Size(5, 5), 5.0, 0, cv::BORDER_DEFAULT);
  cv::Mat gy;
  cv::Sobel(G, gy, CV_32F, 0, 1, 3, 1.0, 0.0, cv::BORDER_DEFAULT);

  // A horizontal erosion keeps only vertical-gradient structures (band tops and bottoms) at
  // least 2k + 1 pixels wide.
  const int k = static_cast<int>(0.15 * bw);
  const cv::Mat element = cv::getStructuringElement(cv::MORPH_RECT, cv::Size(2 * k + 1, 1));
  cv::Mat gErode;
  cv::erode(cv::abs(gy), gErode, element, cv::Point(-1, -1), 1, cv::BORDER_CONSTANT,
            cv::morphologyDefaultBorderValue());

  const int rows = image_.rows;
  const int cols = image_.cols;
  const int d = rows / 20;
  logLine("d: ", d);
  logLine("image.cols: ", cols);
  logLine("G_erode.cols: ", gErode.cols);
  const cv::Mat cut = gErode.rowRange(d, rows - d);

  cv::Mat P;
  cv::reduce(cut, P, 0, cv::REDUCE_SUM);
  logLine("normalize the 1D plot");
  double tmin = 0.0;
  double tmax = 0.0;
  cv::minMaxLoc(P, &tmin, &tmax);
  logLine("tmin = ", tmin, ", tmax = ", tmax);
  // A profile without range would normalise to NaN everywhere, which has no peak (and which
  // the bilateral filter's lookup table cannot take).
  if (!(tmax - tmin > 0)) {
    logLine("Initial detected num of lanes = ", lanesIni.size());
    logLine("Out BandLaneDetectionImpl::initialDetectLanes()");
    return;
  }
  P = (P - tmin) / (tmax - tmin);

  const int halfSpan = static_cast<int>(0.3 * bw);
  cv::Mat F;
  cv::bilateralFilter(P, F, 2 * halfSpan + 1, 0.2, halfSpan, cv::BORDER_DEFAULT);

  std::vector<Peak> peaks;
  findPeaks(F, peaks);
  std::vector<Lane2D> candidates;
  for (const Peak& peak : peaks) {
    Lane2D lane;
    lane.x1 = peak.position;
    lane.x2 = peak.position;
    lane.y1 = 0;
    lane.y2 = rows - 1;
    lane.width = bw;
    lane.lane_s = peak.value;
    lane.mw = false;
    lane.update_flag = false;
    candidates.push_back(lane);
  }
  logLine("lanes_ini.size() = ", candidates.size());
  logLine("band_width_ = ", bw);

  // Earlier (left) candidates win over later ones, whatever their heights.
  std::vector<int> taken = {0, cols};
  for (Lane2D& lane : candidates) {
    int hDistanceMin = std::numeric_limits<int>::max();
    for (int t : taken) hDistanceMin = std::min(hDistanceMin, std::abs(lane.x1 - t));
    logLine("h_distance_min = ", hDistanceMin);
    if (0.6 * bw < hDistanceMin) {
      lane.x1 = std::max(lane.x1, 0);
      lane.x2 = std::min(lane.x2, cols - 1);
      lane.y1 = std::max(lane.y1, 0);
      lane.y2 = std::min(lane.y2, rows - 1);
      lanesIni.push_back(lane);
      taken.push_back(lane.x1);
    }
  }
  logLine("Initial detected num of lanes = ", lanesIni.size());
  logLine("Out BandLaneDetectionImpl::initialDetectLanes()");
}

void BandLaneDetectionImpl::fitLaneBasedBands(const Lane2D& laneIn, Lane2D& laneOut) {
  logLine("In BandLaneDetectionImpl::fitLaneBasedBands()");
  std::vector<Band2D> sorted = laneIn.bands;
  std::stable_sort(sorted.begin(), sorted.end(), byScoreDescending);
  logLine("bands_ini.size() = ", sorted.size());
  if (sorted.empty()) {
    logLine("num_valid_band = 0 ");
    laneOut = laneIn;
    logLine("Out BandLaneDetectionImpl::fitLaneBasedBands()");
    return;
  }

  std::vector<Band2D> valid;
  std::vector<cv::Point2f> centres;
  for (const Band2D& band : sorted) {
    if (band.band_s_y > 0.01 && band.lane_bg_volume > 0.01) {
      valid.push_back(band);
      centres.emplace_back(static_cast<float>((band.x1 + band.x2) * 0.5),
                           static_cast<float>((band.y1 + band.y2) * 0.5));
    }
  }

  laneOut = laneIn;
  laneOut.bands.clear();
  if (valid.empty()) {
    logLine("num_valid_band = 0 ");
  } else if (valid.size() == 1) {
    logLine("num_valid_band = 1 ");
    laneOut.x1 = (valid[0].x1 + valid[0].x2) / 2;
    laneOut.x2 = laneOut.x1;
    laneOut.bands = valid;
  } else {
    logLine("num_valid_band = ", valid.size());
    std::vector<cv::Point2f> inliers;
    cv::Vec4f line;
    lineFittingRansac(centres, inliers, line, static_cast<double>(band_width_ / 4));
    const float vx = line[0];
    const float vy = line[1];
    const float x0 = line[2];
    const float y0 = line[3];
    float angle = cv::fastAtan2(vy, vx);
    if (angle >= 180) angle -= 180;
    logLine("angle: ", angle);
    const float k = vx / vy;
    if (std::fabs(k) <= 0.3 && std::fabs(angle - 90) <= 5.0) {
      laneOut.x1 = static_cast<int32_t>(std::lround((laneIn.y1 - y0) * k + x0));
      laneOut.x2 = static_cast<int32_t>(std::lround((laneIn.y2 - y0) * k + x0));
    } else {
      int sumX = 0;
      for (const cv::Point2f& c : centres) sumX = static_cast<int>(sumX + c.x);
      laneOut.x1 = sumX / static_cast<int>(centres.size());
      laneOut.x2 = laneOut.x1;
      logLine("fabs(k) = ", std::fabs(k));
      logLine("fabs(angle - 90) = ", std::fabs(angle - 90));
      logLine("b = ", x0 - k * y0);
      logLine("fabs(k) > 0.3 || fabs(angle - 90) > 3.0");
    }
    laneOut.bands = valid;
  }
  logLine("Out BandLaneDetectionImpl::fitLaneBasedBands()");
}

void BandLaneDetectionImpl::lineFittingRansac(const std::vector<cv::Point2f>& points,
                                              std::vector<cv::Point2f>& inliers,
                                              cv::Vec4f& line, double threshold) {
  logLine("In BandLaneDetectionImpl::lineFittingRansac().");
  std::vector<cv::Vec4f> candidates;
  for (std::size_t i = 0; i < points.size(); ++i) {
    for (std::size_t j = i + 1; j < points.size(); ++j) {
      const std::vector<cv::Point2f> pair = {points[i], points[j]};
      cv::Vec4f candidate;
      cv::fitLine(pair, candidate, cv::DIST_L2, 0.01, 0.1, 0.01);
      candidates.push_back(candidate);
    }
  }

  // Exhaustive consensus: the first candidate with the most points closer than threshold.
  auto inliersOf = [&](const cv::Vec4f& c) {
    const cv::Point2f A(c[2], c[3]);
    const cv::Point2f B(c[2] + 500 * c[0], c[3] + 500 * c[1]);
    const double length = cv::norm(B - A);
    std::vector<cv::Point2f> support;
    for (const cv::Point2f& p : points) {
      const float cross = (p.y - A.y) * (B.x - A.x) - (B.y - A.y) * (p.x - A.x);
      if (std::fabs(cross) / length < threshold) support.push_back(p);
    }
    return support;
  };
  std::size_t best = 0;
  std::size_t bestCount = 0;
  for (std::size_t c = 0; c < candidates.size(); ++c) {
    const std::size_t count = inliersOf(candidates[c]).size();
    if (count > bestCount) {
      bestCount = count;
      best = c;
    }
  }

  if (!candidates.empty()) {
    const std::vector<cv::Point2f> support = inliersOf(candidates[best]);
    inliers.insert(inliers.end(), support.begin(), support.end());
    // Without any supporting point (a threshold of 0) the best pair's own line stands.
    if (support.empty())
      line = candidates[best];
    else
      cv::fitLine(support, line, cv::DIST_L2, threshold, 0.01, 0.01);
  }
  logLine("Out BandLaneDetectionImpl::lineFittingRansac()");
}

void BandLaneDetectionImpl::refineLanesNew(const std::vector<Lane2D>& lanesIn,
                                           std::vector<Lane2D>& lanesOut) {
  logLine("In BandLaneDetectionImpl::refineLanesNew()");
  lanesOut.clear();
  if (lanesIn.empty()) {
    logLine("Input lanes size < 1. ");
    logLine("Out BandLaneDetectionImpl::refineLanesNew()");
    return;
  }
  logLine("Before adding new lanes, bandlanes_in.size() = ", lanesIn.size());
  for (std::size_t i = 0; i < lanesIn.size(); ++i)
    logLine("num of bands in lane ", i, " = ", lanesIn[i].bands.size());

  const int n = static_cast<int>(lanesIn.size());
  const int lastColumn = normed_image_.cols - 1;
  std::vector<int> cx(n);
  for (int i = 0; i < n; ++i) cx[i] = laneCentre(lanesIn[i]);
  std::vector<int> left(n);
  std::vector<int> right(n);
  std::vector<int> distanceAll;
  // A single lane has no spacing: its right space runs to the frame's edge.
  left[0] = cx[0];
  right[0] = n > 1 ? cx[1] - cx[0] : lastColumn - cx[0];
  for (int i = 1; i < n; ++i) {
    left[i] = cx[i] - cx[i - 1];
    right[i] = i + 1 < n ? cx[i + 1] - cx[i] : lastColumn - cx[i];
    distanceAll.push_back(cx[i] - cx[i - 1]);
  }
  logLine("distance_all.size() ", distanceAll.size());
  logLine("lanes_dis_left.size() ", left.size());
  logLine("lanes_dis_right.size() ", right.size());

  const int W = integerMedian(distanceAll);
  logLine("medium space between lanes = ", W);
  logLine("insert lanes in big empty space");

  const Lane2D& first = lanesIn[0];
  auto insertedLane = [&](int x1, int x2) {
    Lane2D lane;
    lane.x1 = x1;
    lane.x2 = x2;
    lane.y1 = first.y1;
    lane.y2 = first.y2;
    lane.num_bands = first.num_bands;
    lane.lane_s = first.lane_s;
    lane.mw = first.mw;
    lane.update_flag = first.update_flag;
    lane.width = band_width_;
    return lane;
  };

  for (int i = 0; i < n; ++i) {
    logLine("i_lane: ", i);
    const Lane2D& lane = lanesIn[i];
    // A median spacing of 0 gives no gap measure: a lane left of its neighbour is still
    // dropped, as the infinite ratio would decide, but no lanes (infinitely many) are inserted.
    const float r = W != 0 ? static_cast<float>(left[i]) / static_cast<float>(W)
                           : (left[i] < 0 ? -1.0f : 1.0f);
    if (i > 0 && r < 0.3) {
      logLine("left_space = ", left[i]);
      logLine("width_medium = ", W);
      logLine("Remove current lane");
      continue;
    }
    if (r > 1.5) {
      const int m = static_cast<int>(roundf(r - 1.0f));
      logLine("Insert ", m, " lane one the left");
      for (int j = m; j >= 1; --j) {
        if (i == 0) {
          lanesOut.push_back(insertedLane(lane.x1 - j * W, lane.x2 - j * W));
        } else if (m == 1) {
          const Lane2D& previous = lanesIn[i - 1];
          lanesOut.push_back(
              insertedLane((lane.x1 + previous.x1) / 2, (lane.x2 + previous.x2) / 2));
        } else {
          const int s = left[i] / (m + 1);
          lanesOut.push_back(insertedLane(lane.x1 - j * s, lane.x2 - j * s));
        }
      }
    }
    lanesOut.push_back(lane);
    if (i == n - 1 && W != 0) {
      const float rr = static_cast<float>(right[i] / W);
      if (rr > 1.5) {
        const int m = static_cast<int>(roundf(rr - 1.0f));
        for (int j = 1; j <= m; ++j)
          lanesOut.push_back(insertedLane(lane.x1 + j * W, lane.x2 + j * W));
      }
    }
  }

  logLine("Lane profile after filling empty space.");
  for (std::size_t i = 0; i < lanesOut.size(); ++i) {
    logLine("lane_", i);
    printLane2D(lanesOut[i]);
  }
  logLine("band_width_ = ", band_width_);
  logLine("Num of input lanes = ", lanesIn.size());
  logLine("Num of output lanes = ", lanesOut.size());
  logLine("Out BandLaneDetectionImpl::refineLanesNew()");
}

}  // namespace viraduve
