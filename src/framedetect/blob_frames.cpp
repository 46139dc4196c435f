// The blob route of frame detection: Otsu split, opening and blob labelling at full
// resolution, taken only when the image is clearly two-level (membranes on a background).
#include <algorithm>
#include <cstdint>

#include <opencv2/core.hpp>

#include "framedetect/blobkit/blob_finder.h"
#include "framedetect/blobkit/histogram.h"
#include "framedetect/blobkit/run_morphology.h"
#include "framedetect/blobkit/threshold.h"
#include "framedetect/frame_detection.h"

namespace viraduve {

namespace {

// Row by row, so matrices with padded rows or region views are copied correctly.
blobkit::GreyImage toGreyImage(const cv::Mat& grey) {
  blobkit::GreyImage image(static_cast<uint32_t>(grey.cols), static_cast<uint32_t>(grey.rows));
  for (int r = 0; r < grey.rows; ++r) {
    const uint8_t* src = grey.ptr<uint8_t>(r);
    std::copy(src, src + grey.cols, image.row(static_cast<uint32_t>(r)));
  }
  return image;
}

uint8_t regionThreshold(const blobkit::GreyImage& image, int x, int y, int width, int height) {
  std::vector<uint32_t> histogram;
  blobkit::computeHistogram(image, static_cast<uint32_t>(x), static_cast<uint32_t>(y),
                            static_cast<uint32_t>(width), static_cast<uint32_t>(height),
                            histogram);
  return blobkit::otsuThreshold(histogram);
}

}  // namespace

std::vector<ROI> detectFramesByBlobs(const cv::Mat& grey) {
  CV_Assert(grey.type() == CV_8UC1);
  const int w = grey.cols;
  const int h = grey.rows;
  blobkit::GreyImage image = toGreyImage(grey);

  // An uneven background gives different splits in different parts of the image.
  const uint8_t regionThresholds[4] = {
      regionThreshold(image, 0, 0, w, 2 * h / 3),
      regionThreshold(image, 0, h / 3, w, 2 * h / 3),
      regionThreshold(image, 0, 0, 2 * w / 3, h),
      regionThreshold(image, w / 3, 0, 2 * w / 3, h),
  };
  const auto [lowest, highest] = std::minmax_element(regionThresholds, regionThresholds + 4);
  if (*highest - *lowest >= 6) return {};

  std::vector<uint32_t> histogram;
  blobkit::computeHistogram(image, histogram);
  const uint8_t t = blobkit::otsuThreshold(histogram);

  // 64-bit sums: the same integer arithmetic, without overflow on large captures.
  uint64_t countLow = 0, sumLow = 0, countHigh = 0, sumHigh = 0;
  for (uint32_t v = 0; v < 256; ++v) {
    if (v < t) {
      countLow += histogram[v];
      sumLow += uint64_t(v) * histogram[v];
    } else {
      countHigh += histogram[v];
      sumHigh += uint64_t(v) * histogram[v];
    }
  }
  const int64_t meanLow = countLow ? int64_t(sumLow / countLow) : 0;
  const int64_t meanHigh = countHigh ? int64_t(sumHigh / countHigh) : 0;
  const int64_t darkPercent = int64_t(countLow * 100 / uint64_t(w)) / h;
  if (meanHigh < 3 * meanLow || meanHigh < meanLow + 64 || darkPercent < 10 ||
      100 - darkPercent < 5) {
    return {};
  }

  blobkit::GreyImage binary;
  blobkit::thresholdImage(image, binary, t);
  blobkit::erodeRuns(binary, 5, 5);
  blobkit::dilateRuns(binary, 5, 5);

  blobkit::BlobFinder finder;
  finder.find(binary, blobkit::BlobCriteria{}, 1);
  const blobkit::BlobRecord* largest = finder.largestBlob(blobkit::BlobProperty_PixelCount);
  if (largest == nullptr) return {};
  const uint64_t n = largest->size();
  if (int64_t(n * 100 / uint64_t(w)) / h < 5) return {};

  std::vector<ROI> frames;
  for (const blobkit::BlobRecord& blob : finder.blobs()) {
    if (blob.size() <= n / 3) continue;
    const blobkit::BlobBounds& b = blob.bounds();
    frames.push_back(ROI{int32_t(b.left), int32_t(b.top), int32_t(b.right), int32_t(b.bottom)});
  }
  return frames;
}

}  // namespace viraduve
