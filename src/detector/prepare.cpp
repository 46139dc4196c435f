// The two detection entry points, the image preparation every detection begins with, and
// the mapping of detected lanes and bands from frame back to image coordinates.
#include <algorithm>
#include <cmath>

#include <opencv2/imgproc.hpp>

#include "common/log.h"
#include "detector/BandLaneDetectionImpl.h"
#include "detector/detector_helpers.h"

namespace viraduve {

namespace {

const char* const kSourceFile = "DaduZerovoVur\\BandLaneDetection";

// Decodes the picture as 8-bit grey and asserts it is usable, as OpenCV's own check would.
cv::Mat decodeForDetection(const Image& image, const char* function, int line) {
  cv::Mat img = image.decodeGrey8();
  if (!(!img.empty() && img.channels() == 1))
    cv::error(cv::Error::StsAssert, "!img.empty() && img.channels() == 1", function, kSourceFile,
              line);
  return img;
}

double stripSum(const cv::Mat& image, const cv::Rect& strip) { return cv::sum(image(strip))[0]; }

// cv::resize keeps an image of the target size as it is; the copy it would make is skipped.
void resizeInPlace(cv::Mat_<float>& image, const cv::Size& size) {
  if (image.size() == size) return;
  cv::Mat resized;
  cv::resize(image, resized, size, 0, 0, cv::INTER_LINEAR);
  image = resized;
}

// Maps one box (lane line or band) from frame to image coordinates and clamps it to the frame.
template <typename Box>
void mapToImage(Box& box, const ROI& roi, double scaleFactor) {
  if (std::fabs(scaleFactor - 1.0) >= 0.0001) {
    box.x1 = static_cast<int32_t>(std::round(box.x1 / scaleFactor + roi.x1 - 0.49));
    box.y1 = static_cast<int32_t>(std::round(box.y1 / scaleFactor + roi.y1 - 0.49));
    box.x2 = static_cast<int32_t>(std::round(box.x2 / scaleFactor + roi.x1 + 0.49));
    box.y2 = static_cast<int32_t>(std::round(box.y2 / scaleFactor + roi.y1 + 0.49));
  } else {
    box.x1 += roi.x1;
    box.y1 += roi.y1;
    box.x2 += roi.x1;
    box.y2 += roi.y1;
  }
  box.x1 = std::max(box.x1, roi.x1);
  box.y1 = std::max(box.y1, roi.y1);
  box.x2 = std::min(box.x2, roi.x2);
  box.y2 = std::min(box.y2, roi.y2);
}

}  // namespace

void BandLaneDetectionImpl::detect(const Image& image, const ROI& frame,
                                   std::vector<Lane2D>& lanes) {
  logLine("In BandLaneDetectionImpl::detect(). ");
  const cv::Mat img =
      decodeForDetection(image, "viraduve::BandLaneDetectionImpl::detect", __LINE__);
  prepareData(img, frame);
  logLine("Overlay image for lane detection.");
  logLine("background_: ", background_);
  std::vector<Lane2D> found;
  detectLanes(found);
  scaleAndShiftBandLanes(found, frame, scale_factor_);
  lanes = std::move(found);
  logLine("Out BandLaneDetectionImpl::detect(). ");
}

void BandLaneDetectionImpl::detect_new(const Image& image, const ROI& frame,
                                       const std::vector<Lane2D>& lanesIn, uint32_t channel,
                                       std::vector<Lane2D>& lanesOut) {
  logLine("In BandLaneDetectionImpl::detect_new().");
  const cv::Mat img =
      decodeForDetection(image, "viraduve::BandLaneDetectionImpl::detect_new", __LINE__);
  // Band update works on the whole image: the lanes carry image coordinates.
  prepareData(img, ROI{0, 0, img.cols - 1, img.rows - 1});
  if (!lanesIn.empty()) {
    std::vector<Lane2D> lanes = lanesIn;
    std::vector<Lane2D> result;
    detectBands(lanes, channel, frame, result);
    filterBands(result, channel);
    lanesOut = std::move(result);
    logLine("Out BandLaneDetectionImpl::detect_new().");
  } else {
    lanesOut = lanesIn;
    logLine("No lane for band detection");
  }
}

void BandLaneDetectionImpl::prepareData(const cv::Mat& img, const ROI& roi) {
  logLine("In BandLaneDetectionImpl::prepareData().");
  if (!(roi.x1 >= 0 && roi.x2 <= img.cols - 1 && roi.y1 >= 0 && roi.y2 <= img.rows - 1) ||
      roi.x2 < roi.x1 || roi.y2 < roi.y1)
    throw Exception(-4, "ERROR! In valid ROI", "viraduve::BandLaneDetectionImpl::prepareData",
                    kSourceFile, __LINE__);

  cv::Mat N;
  img.convertTo(N, CV_32F, 1.0, 0.0);
  N = N / 255.0;

  double minVal = 0.0;
  double maxVal = 0.0;
  cv::minMaxLoc(img, &minVal, &maxVal);
  logLine("min val : ", minVal);
  logLine("max val: ", maxVal);
  logLine("background_: ", background_);

  if (background_ == 1) {
    N = 1.0 - N;
  } else if (background_ == 0) {
    const int cols = N.cols;
    const int rows = N.rows;
    const double borderSum = stripSum(N, cv::Rect(0, 0, cols, 1)) +
                             stripSum(N, cv::Rect(0, 0, 1, rows)) +
                             stripSum(N, cv::Rect(0, rows - 1, cols, 1)) +
                             stripSum(N, cv::Rect(cols - 1, 0, 1, rows));
    const double borderMean = borderSum / (2 * cols + 2 * rows);
    if (borderMean > 0.4) {
      background_ = 1;
      N = 1.0 - N;
    } else {
      background_ = -1;
    }
  }

  const cv::Rect frame(roi.x1, roi.y1, roi.x2 - roi.x1 + 1, roi.y2 - roi.y1 + 1);
  // The frame images are only read after preparation, so equal ones share one buffer (a full
  // copy of a large frame costs more than the filtering that follows); a resize gives the
  // resized image its own buffer.
  image_ = N(frame).clone();
  normed_image_ = image_;

  scale_factor_ = 1.0;
  resizeInPlace(image_, cv::Size(cv::saturate_cast<int>(image_.cols * scale_factor_),
                                 cv::saturate_cast<int>(image_.rows * scale_factor_)));
  logLine("normed_image_.cols = ", normed_image_.cols);

  img_norm_ = N;  // N is not used after this
  logLine("Image size, img_norm.cols() = ", img_norm_.cols);
  logLine("Frame size, normed_image_.cols() = ", normed_image_.cols);

  scaled_image_ = normed_image_;
  resizeInPlace(normed_image_,
                cv::Size(static_cast<int>(std::round(normed_image_.cols * scale_factor_)),
                         static_cast<int>(std::round(normed_image_.rows * scale_factor_))));

  cv::Mat smoothed;
  cv::GaussianBlur(normed_image_, smoothed, cv::Size(5, 5), 5.0, 0, cv::BORDER_DEFAULT);
  smoothed_image_ = smoothed;

  cv::Mat gx;
  cv::Mat gy;
  cv::Sobel(smoothed_image_, gx, CV_32F, 1, 0, 3, 1.0, 0.0, cv::BORDER_DEFAULT);
  cv::Sobel(smoothed_image_, gy, CV_32F, 0, 1, 3, 1.0, 0.0, cv::BORDER_DEFAULT);
  grad_x_1 = gx;
  grad_x_2 = cv::Mat(-gx);
  splitSigns(gy, grad_y_1, grad_y_2);

  logLine("scaled_image_.cols() ", scaled_image_.cols);
  logLine("normed_image_.cols() ", normed_image_.cols);
  logLine("grad_x_1.cols ", grad_x_1.cols);
  logLine("grad_x_1.rows ", grad_x_1.rows);
  logLine("grad_y_1.cols ", grad_y_1.cols);
  logLine("grad_y_1.rows ", grad_y_1.rows);
  logLine("Out BandLaneDetectionImpl::prepareData().");
}

void BandLaneDetectionImpl::scaleAndShiftBandLanes(std::vector<Lane2D>& lanes, const ROI& roi,
                                                   double scaleFactor) {
  logLine("In BandLaneDetectionImpl::scaleAndShiftBandLanes().");
  logLine("scaleFactor = ", scaleFactor);
  if (lanes.empty()) {
    logLine("Input bandLane2dVec is empty.");
    return;
  }
  for (Lane2D& lane : lanes) {
    mapToImage(lane, roi, scaleFactor);
    lane.mw = false;
    lane.update_flag = true;
    lane.width = static_cast<int32_t>(std::round(band_width_ / scaleFactor));
    logLine("After rescale, lane width =  ", lane.width);
    if (lane.bands.empty()) logLine("There is no band in current lane.");
    for (Band2D& band : lane.bands) mapToImage(band, roi, scaleFactor);
  }
  logLine("Out BandLaneDetectionImpl::scaleAndShiftBandLanes().");
}

}  // namespace viraduve
