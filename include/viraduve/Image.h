// One channel picture of a capture. The picture is held as a decoded matrix; its TIFF
// encoding (OpenCV's encoder, ".tif", no parameters) is produced only when asked for.
// TIFF is lossless, so decoding those bytes gives back exactly the held matrix.
#pragma once

#include <string>
#include <vector>

#include <opencv2/core/mat.hpp>

#include "viraduve/export.h"

namespace viraduve {

class VIRADUVE_EXPORT Image {
 public:
  Image();
  // Loads directory + "/" + fileName.
  Image(const std::string& directory, const std::string& fileName);
  Image(const Image& other);
  Image& operator=(const Image& other);
  Image(Image&& other) noexcept;
  Image& operator=(Image&& other) noexcept;
  virtual ~Image();

  // The TIFF bytes of the picture (encoded on first request).
  const std::vector<unsigned char>& encoded() const;
  // Replaces the picture by encoded bytes; cols and rows are left as they were.
  void setEncoded(std::vector<unsigned char> bytes);

  int cols() const { return cols_; }
  int rows() const { return rows_; }
  void setCols(int cols) { cols_ = cols; }
  void setRows(int rows) { rows_ = rows; }
  float exposureTime() const { return exposureTime_; }
  void setExposureTime(float t) { exposureTime_ = t; }

  // Reads path as any depth greyscale, 8-bit promoted to 16-bit (x255); throws -3 errors.
  void _load(const std::string& path);

  // The picture as cv::imdecode(encoded(), -1) would give it. Shared, do not modify.
  const cv::Mat& mat() const;
  // Replaces the picture as if it had been encoded as TIFF; sets cols and rows.
  void setMat(const cv::Mat& picture);
  // The picture as cv::imdecode(encoded(), 0) would give it: 8-bit, one channel.
  cv::Mat decodeGrey8() const;

  static std::string typeText(int type);

 private:
  mutable std::vector<unsigned char> encoded_;
  mutable cv::Mat mat_;
  mutable bool haveBytes_ = false;
  mutable bool haveMat_ = false;
  int cols_ = 0;
  int rows_ = 0;
  float exposureTime_ = 0.0f;
};

// Each decodes src, transforms, stores into dst (sizes from the result, exposure from src).
// src and dst may be the same object.
VIRADUVE_EXPORT void flipChannelImage(const Image& src, Image& dst, bool flipH, bool flipV);
VIRADUVE_EXPORT void invertChannelImage(const Image& src, Image& dst, int maxValue);
VIRADUVE_EXPORT void rotateChannelImage(const Image& src, Image& dst, float angleDegrees,
                                        int fillMode);

}  // namespace viraduve
