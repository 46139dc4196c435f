// Region forms of the analysis: user-drawn rectangles and circles measured like bands, with
// the global background from a rectangle (slot 3) or a circle (slot 2).
#include "detector/regions.h"

#include <algorithm>
#include <cmath>

#include "common/log.h"
#include "detector/BandLaneDetectionImpl.h"
#include "detector/measure.h"

namespace viraduve {

namespace {

// Squared distances are formed in 128 bits: centres and radii are unsigned 32-bit request
// values, whose squares and their sums do not fit in 64 bits.
using Wide = __int128;

// Row-major visit of the pixels of A strictly inside the circle of the given radius around
// (cx, cy), restricted to the circle's bounding box clipped to the image: the same pixels in
// the same order as a scan of the whole image.
template <typename Visit>
void forEachPixelInDisc(const cv::Mat& A, int64_t cx, int64_t cy, int64_t radius, Visit visit) {
  if (radius <= 0) return;
  const Wide limit = static_cast<Wide>(radius) * radius;
  const int64_t rowFirst = std::max<int64_t>(0, cy - radius + 1);
  const int64_t rowLast = std::min<int64_t>(A.rows - 1, cy + radius - 1);
  const int64_t colFirst = std::max<int64_t>(0, cx - radius + 1);
  const int64_t colLast = std::min<int64_t>(A.cols - 1, cx + radius - 1);
  for (int64_t r = rowFirst; r <= rowLast; ++r) {
    const Wide dy2 = static_cast<Wide>(r - cy) * (r - cy);
    for (int64_t c = colFirst; c <= colLast; ++c) {
      if (static_cast<Wide>(c - cx) * (c - cx) + dy2 < limit) {
        visit(static_cast<int>(r), static_cast<int>(c));
      }
    }
  }
}

void storeBox(const BoxMeasures& m, Region2D& region) {
  region.volume = m.volume;
  region.area = m.area;
  region.density = m.density;
  region.median_intensity = m.median_intensity;
  region.local_bg_volume = m.local_bg_volume;
  region.local_bg_density = m.local_bg_density;
  region.global_bg_volume = m.global_bg_volume;
  region.global_bg_density = m.global_bg_density;
  region.rolling_bg_volume = m.rolling_bg_volume;
  region.rolling_bg_density = m.rolling_bg_density;
}

}  // namespace

void measureCircleRegion(const cv::Mat& A, const cv::Mat& T, double G, Region2D& region) {
  CV_Assert(A.type() == CV_32FC1 && T.type() == CV_32FC1 && A.size() == T.size());
  const int64_t cx = region.x;
  const int64_t cy = region.y;
  const int64_t rho = region.circle_radius;

  double localSum = 0.0;
  int64_t localCount = 0;
  forEachPixelInDisc(A, cx, cy, rho + 5, [&](int r, int c) {
    localSum += A.ptr<float>(r)[c];
    ++localCount;
  });
  const double bLoc = localSum / static_cast<double>(localCount);

  double volume = 0.0;
  double globalVolume = 0.0;
  double localVolume = 0.0;
  double rollingVolume = 0.0;
  std::vector<float> values;
  forEachPixelInDisc(A, cx, cy, rho, [&](int r, int c) {
    const float a = A.ptr<float>(r)[c];
    volume += a;
    globalVolume += std::max(0, static_cast<int>(a - G));
    localVolume += std::max(0, static_cast<int>(a - bLoc));
    rollingVolume += T.ptr<float>(r)[c];
    values.push_back(a);
  });

  const double area = static_cast<double>(values.size());
  // A circle without pixels has no median (the selection would read an empty list).
  double median = 0.0;
  if (!values.empty()) {
    const auto middle = values.begin() + static_cast<std::ptrdiff_t>(values.size() / 2);
    std::nth_element(values.begin(), middle, values.end());
    median = *middle;
  }
  region.volume = volume;
  region.area = area;
  region.density = volume / area;
  region.median_intensity = median;
  region.local_bg_volume = localVolume;
  region.local_bg_density = localVolume / area;
  region.global_bg_volume = globalVolume;
  region.global_bg_density = globalVolume / area;
  region.rolling_bg_volume = rollingVolume;
  region.rolling_bg_density = rollingVolume / area;
}

void measureRegions(const cv::Mat& A, const cv::Mat& T, double G, uint32_t channel,
                    std::vector<Region2D>& regions) {
  bool measured = false;
  for (Region2D& region : regions) {
    if (region.channel != channel) continue;
    if (region.circle_b) {
      measureCircleRegion(A, T, G, region);
    } else {
      const ROI box{static_cast<int32_t>(region.x1), static_cast<int32_t>(region.y1),
                    static_cast<int32_t>(region.x2), static_cast<int32_t>(region.y2)};
      storeBox(measureBox(A, T, box, G), region);
    }
    measured = true;
  }
  if (!measured) return;

  // Purity is the share of the channel's local-background volume; recomputing it after every
  // region ends with the complete sums, which is what is computed once here.
  float sloc = 0.0f;
  for (const Region2D& region : regions) {
    if (region.channel == channel) sloc = static_cast<float>(sloc + region.local_bg_volume);
  }
  for (Region2D& region : regions) {
    if (region.channel != channel) continue;
    region.purity = std::fabs(sloc) < 0.0001 ? 0.0 : region.local_bg_volume / static_cast<double>(sloc);
  }
}

void BandLaneDetectionImpl::analyis(const Image& image, std::vector<Region2D>& regions,
                                    uint32_t channel, const Circle& gbCircle, int32_t radius) {
  logLine("In BandLaneDetectionImpl::analyis().");
  cv::Mat A;
  cv::Mat T;
  prepareAnalysisImages(image, background_, radius, A, T);
  measureRegions(A, T, globalBackgroundCircle(A, gbCircle), channel, regions);
  logLine("Out BandLaneDetectionImpl::analyis().");
}

void BandLaneDetectionImpl::analyis(const Image& image, std::vector<Region2D>& regions,
                                    uint32_t channel, const ROI& gbRoi, int32_t radius) {
  logLine("In BandLaneDetectionImpl::analyis().");
  cv::Mat A;
  cv::Mat T;
  prepareAnalysisImages(image, background_, radius, A, T);
  measureRegions(A, T, globalBackgroundRect(A, gbRoi), channel, regions);
  logLine("Out BandLaneDetectionImpl::analyis().");
}

}  // namespace viraduve
