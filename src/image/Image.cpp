// viraduve::Image: loading with the 8-bit to 16-bit rule, and mirror, invert, rotate.
#include "viraduve/Image.h"

#include <cmath>
#include <cstdint>
#include <utility>

#include <opencv2/core.hpp>
#include <opencv2/imgcodecs.hpp>
#include <opencv2/imgproc.hpp>

#include "common/log.h"
#include "viraduve/Exception.h"

namespace viraduve {

Image::Image() = default;

Image::Image(const std::string& directory, const std::string& fileName) {
  _load(directory + "/" + fileName);
}

Image::Image(const Image& other)
    : encoded_(other.encoded_),
      mat_(other.haveMat_ ? other.mat_.clone() : cv::Mat()),
      haveBytes_(other.haveBytes_),
      haveMat_(other.haveMat_),
      cols_(other.cols_),
      rows_(other.rows_),
      exposureTime_(other.exposureTime_) {}

Image& Image::operator=(const Image& other) {
  if (this != &other) {
    Image copy(other);
    *this = std::move(copy);
  }
  return *this;
}

Image::Image(Image&& other) noexcept = default;
Image& Image::operator=(Image&& other) noexcept = default;
Image::~Image() = default;

const std::vector<unsigned char>& Image::encoded() const {
  if (!haveBytes_) {
    encoded_.clear();
    if (haveMat_ && !mat_.empty()) cv::imencode(".tif", mat_, encoded_);
    haveBytes_ = true;
  }
  return encoded_;
}

void Image::setEncoded(std::vector<unsigned char> bytes) {
  encoded_ = std::move(bytes);
  haveBytes_ = true;
  mat_.release();
  haveMat_ = false;
}

const cv::Mat& Image::mat() const {
  if (!haveMat_) {
    mat_ = (haveBytes_ && !encoded_.empty()) ? cv::imdecode(encoded_, cv::IMREAD_UNCHANGED)
                                             : cv::Mat();
    haveMat_ = true;
  }
  return mat_;
}

void Image::setMat(const cv::Mat& picture) {
  mat_ = picture.clone();
  haveMat_ = true;
  encoded_.clear();
  haveBytes_ = false;
  cols_ = mat_.cols;
  rows_ = mat_.rows;
}

cv::Mat Image::decodeGrey8() const {
  const cv::Mat& m = mat();
  cv::Mat grey;
  if (m.empty()) return grey;
  // For one-channel 16-bit TIFF data OpenCV's greyscale decoding keeps the high byte.
  if (m.type() == CV_16UC1) {
    cv::Mat exact(m.size(), CV_8UC1);
    for (int r = 0; r < m.rows; ++r) {
      const ushort* src = m.ptr<ushort>(r);
      uchar* dst = exact.ptr<uchar>(r);
      for (int c = 0; c < m.cols; ++c) dst[c] = static_cast<uchar>(src[c] >> 8);
    }
    return exact;
  }
  if (m.type() == CV_8UC1) return m.clone();
  return cv::imdecode(encoded(), cv::IMREAD_GRAYSCALE);
}

std::string Image::typeText(int type) {
  std::string depth;
  switch (CV_MAT_DEPTH(type)) {
    case CV_8U: depth = "8U"; break;
    case CV_8S: depth = "8S"; break;
    case CV_16U: depth = "16U"; break;
    case CV_16S: depth = "16S"; break;
    case CV_32S: depth = "32S"; break;
    case CV_32F: depth = "32F"; break;
    case CV_64F: depth = "64F"; break;
    default: depth = "User"; break;
  }
  return depth + "C" + std::to_string(CV_MAT_CN(type));
}

void Image::_load(const std::string& path) {
  exposureTime_ = 0.0f;
  logLine("Loaded Image Path is ", path);
  cv::Mat m = cv::imread(path, cv::IMREAD_ANYDEPTH);
  if (m.empty()) {
    throw Exception(-3, "ERROR! Image File Not Sucessfully Loaded", "viraduve::Image::_load",
                    "DaduZerovoVur\\Image", 203);
  }
  if (typeText(m.type()).find("8U") != std::string::npos) m.convertTo(m, CV_16U, 255.0, 0.0);
  if (typeText(m.type()) != "16UC1") {
    throw Exception(-3, "ERROR! Image Format is Not Supported", "viraduve::Image::_load",
                    "DaduZerovoVur\\Image", 200);
  }
  setMat(m);
}

namespace {

constexpr int64_t kMaxRotationCanvasPixels = int64_t{1} << 31;

void store(const Image& src, Image& dst, const cv::Mat& result) {
  const float exposure = src.exposureTime();
  dst.setMat(result);
  dst.setExposureTime(exposure);
}

}  // namespace

void flipChannelImage(const Image& src, Image& dst, bool flipH, bool flipV) {
  cv::Mat m = src.mat().clone();
  if (flipH) cv::flip(m, m, 1);
  if (flipV) cv::flip(m, m, 0);
  store(src, dst, m);
}

void invertChannelImage(const Image& src, Image& dst, int maxValue) {
  cv::Mat m;
  cv::subtract(cv::Scalar::all(maxValue), src.mat(), m);
  store(src, dst, m);
}

void rotateChannelImage(const Image& src, Image& dst, float angleDegrees, int fillMode) {
  const cv::Mat& m = src.mat();
  if (std::fabs(angleDegrees) < 0.001f) {
    store(src, dst, m);
    return;
  }
  // An infinite or undefined angle (a huge request value narrowed to float) would make every
  // corner of the crop undefined.
  if (!std::isfinite(angleDegrees)) {
    throw Exception(-4, "ERROR! Rotation angle is not a finite number",
                    "viraduve::rotateChannelImage", "DaduZerovoVur\\Image", 0);
  }
  const double fill = fillMode == 1 ? 65535.0 : 0.0;
  const int rows = m.rows;
  const int cols = m.cols;
  // The sum of squares in 64 bits: the same value wherever 32 bits hold it, and defined for
  // the largest pictures too.
  const int64_t squares = static_cast<int64_t>(rows) * rows + static_cast<int64_t>(cols) * cols;
  const double diagonal = std::trunc(std::sqrt(static_cast<double>(squares)));
  // The canvas is the square of the diagonal: for a long, thin picture that is far more
  // memory than the picture itself, and more than any host has (an over-committed allocation
  // would only fail when it is filled). Every square picture the decoder accepts (at most
  // 2^30 pixels) still fits.
  if (diagonal * diagonal > static_cast<double>(kMaxRotationCanvasPixels)) {
    throw Exception(-3, "ERROR! Image is too large to rotate", "viraduve::rotateChannelImage",
                    "DaduZerovoVur\\Image", 0);
  }
  const int d = static_cast<int>(diagonal);
  const int padC = (d - cols) / 2;
  const int padR = (d - rows) / 2;
  cv::Mat canvas(d, d, m.type(), cv::Scalar::all(fill));
  m.copyTo(canvas(cv::Rect(padC, padR, cols, rows)));
  const cv::Mat M = cv::getRotationMatrix2D(cv::Point2f(d * 0.5f, d * 0.5f), angleDegrees, 1.0);
  cv::Mat rotated;
  cv::warpAffine(canvas, rotated, M, cv::Size(d, d), cv::INTER_CUBIC, cv::BORDER_CONSTANT,
                 cv::Scalar::all(fill));
  cv::Mat corners = (cv::Mat_<double>(3, 4) << padC, padC + cols, padC, padC + cols,  //
                     padR, padR, padR + rows, padR + rows,                              //
                     1, 1, 1, 1);
  cv::Mat moved = M * corners;
  int left = cols, top = rows, right = 0, bottom = 0;
  for (int i = 0; i < 4; ++i) {
    const int x = static_cast<int>(moved.at<double>(0, i));
    const int y = static_cast<int>(moved.at<double>(1, i));
    left = std::min(left, x);
    right = std::max(right, x);
    top = std::min(top, y);
    bottom = std::max(bottom, y);
  }
  store(src, dst, rotated(cv::Rect(left, top, right - left, bottom - top)).clone());
}

}  // namespace viraduve
