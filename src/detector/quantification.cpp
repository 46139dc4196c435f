// Band and lane quantification: every band of one channel is measured against its local,
// global and rolling-ball backgrounds, placed along its lane (rf) and given its share of
// the lane (purities). Results are written into the caller's Band2D records.
#include <algorithm>
#include <vector>

#include "common/log.h"
#include "detector/BandLaneDetectionImpl.h"
#include "detector/measure.h"

namespace viraduve {

namespace {

void logBox(int x1, int y1, int x2, int y2) {
  logLine("x1 = ", x1, ", ", "y1 = ", y1, ", ", "x2 = ", x2, ", ", "y2 = ", y2, ", ");
}

// Relative migration: the band's integer centre row along the lane, in single precision.
float relativeFront(const Band2D& band, const Lane2D& lane) {
  const int centre = (band.y1 + band.y2) / 2;
  return (static_cast<float>(centre) - static_cast<float>(lane.y1)) /
         (static_cast<float>(lane.y2) - static_cast<float>(lane.y1));
}

// The measuring and purity passes over the lanes, shared by both global-background forms.
void measureLanes(const cv::Mat& A, const cv::Mat& T, double G, std::vector<Lane2D>& lanes,
                  uint32_t channel, bool verbose) {
  for (std::size_t i = 0; i < lanes.size(); ++i) {
    Lane2D& lane = lanes[i];
    if (verbose) {
      logLine("lane_", i);
      logBox(lane.x1, lane.y1, lane.x2, lane.y2);
      logLine("lanewidth = ", lane.width);
      logLine("numOfBands = ", lane.bands.size());
    }
    for (std::size_t j = 0; j < lane.bands.size(); ++j) {
      Band2D& band = lane.bands[j];
      if (verbose) logLine("band_", j);
      if (band.channel != channel) continue;
      if (verbose) logBox(band.x1, band.y1, band.x2, band.y2);

      const BoxMeasures m = measureBox(A, T, ROI{band.x1, band.y1, band.x2, band.y2}, G);
      const float rf = relativeFront(band, lane);
      band.volume = m.volume;
      band.area = m.area;
      band.density = m.density;
      band.median_intensity = m.median_intensity;
      band.local_bg_volume = m.local_bg_volume;
      if (verbose) logLine("local_bg_volume = ", band.local_bg_volume);
      band.local_bg_density = m.local_bg_density;
      band.rolling_bg_volume = m.rolling_bg_volume;
      band.rolling_bg_density = m.rolling_bg_density;
      band.global_bg_volume = m.global_bg_volume;
      band.global_bg_density = m.global_bg_density;
      band.rf = rf;
    }
  }

  for (Lane2D& lane : lanes) {
    // The lane's local-background total counts every band, whatever its channel, as far
    // as earlier channels have filled it; accumulated in single precision.
    float sloc = 0.0f;
    for (const Band2D& band : lane.bands) sloc += band.local_bg_volume;
    const bool anyOfChannel = std::any_of(lane.bands.begin(), lane.bands.end(),
                                          [&](const Band2D& b) { return b.channel == channel; });
    if (!anyOfChannel) continue;
    const float vlane = laneMaskSum(A, lane);
    for (Band2D& band : lane.bands) {
      if (band.channel != channel) continue;
      band.purity_band = band.local_bg_volume / static_cast<double>(sloc);
      band.purity_lane = band.volume / static_cast<double>(vlane);
    }
  }
}

}  // namespace

void BandLaneDetectionImpl::analyis(const Image& image, std::vector<Lane2D>& lanes,
                                    uint32_t channel, const Circle& gbCircle, int32_t radius) {
  logLine("In BandLaneDetectionImpl::analyis().");
  cv::Mat A;
  cv::Mat T;
  prepareAnalysisImages(image, background_, radius, A, T);
  const double G = globalBackgroundCircle(A, gbCircle);
  measureLanes(A, T, G, lanes, channel, false);
  logLine("Out BandLaneDetectionImpl::analyis().");
}

void BandLaneDetectionImpl::analyis(const Image& image, std::vector<Lane2D>& lanes,
                                    uint32_t channel, const ROI& gbRoi, int32_t radius) {
  logLine("In BandLaneDetectionImpl::analyis().");
  cv::Mat A;
  cv::Mat T;
  prepareAnalysisImages(image, background_, radius, A, T);
  const cv::Rect gbRect(gbRoi.x1, gbRoi.y1, gbRoi.x2 - gbRoi.x1 + 1, gbRoi.y2 - gbRoi.y1 + 1);
  // An empty rectangle is refused by globalBackgroundRect, before anything is logged.
  if (gbRect.width > 0 && gbRect.height > 0) {
    const cv::Mat R = A(gbRect);
    logLine("src.rows = ", A.rows);
    logLine("src.cols = ", A.cols);
    logLine("gb_roi.rows = ", R.rows);
    logLine("gb_roi.cols = ", R.cols);
  }
  const double G = globalBackgroundRect(A, gbRoi);
  logLine("channel_= ", channel);
  logLine("numOfLane = ", lanes.size());
  measureLanes(A, T, G, lanes, channel, true);
  logLine("Out BandLaneDetectionImpl::analyis().");
}

float BandLaneDetectionImpl::computeMedian(const cv::Mat& matrix) {
  if (matrix.empty() || matrix.total() == 0) return 0.0f;
  std::vector<float> values;
  values.reserve(matrix.total());
  for (int r = 0; r < matrix.rows; ++r) {
    const float* row = matrix.ptr<float>(r);
    values.insert(values.end(), row, row + matrix.cols);
  }
  const std::size_t middle = values.size() / 2;
  std::nth_element(values.begin(), values.begin() + static_cast<std::ptrdiff_t>(middle),
                   values.end());
  return values[middle];
}

}  // namespace viraduve
