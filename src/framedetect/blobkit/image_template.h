// ImageTemplate: an owned pixel buffer with rows padded to an alignment, plus the argument
// checks that every blobkit image function runs before touching pixels.
#pragma once

#include <algorithm>
#include <cstdint>
#include <cstring>
#include <limits>
#include <memory>
#include <stdexcept>

#include "framedetect/blobkit/image_exception.h"

namespace blobkit {

template <typename T>
class ImageTemplate {
 public:
  ImageTemplate() = default;
  ImageTemplate(uint32_t width, uint32_t height, uint8_t channels = 1, uint8_t alignment = 1)
      : width_(width), height_(height), channels_(channels), alignment_(alignment) {
    allocate();
  }
  ImageTemplate(const ImageTemplate& other)
      : width_(other.width_),
        height_(other.height_),
        channels_(other.channels_),
        alignment_(other.alignment_) {
    allocate();
    if (data_) std::memcpy(data_.get(), other.data_.get(), byteCount());
  }
  ImageTemplate& operator=(const ImageTemplate& other) {
    if (this != &other) {
      ImageTemplate copy(other);
      *this = std::move(copy);
    }
    return *this;
  }
  ImageTemplate(ImageTemplate&&) noexcept = default;
  ImageTemplate& operator=(ImageTemplate&&) noexcept = default;
  virtual ~ImageTemplate() = default;

  uint32_t width() const { return width_; }
  uint32_t height() const { return height_; }
  uint8_t channels() const { return channels_; }
  uint8_t alignment() const { return alignment_; }
  // Bytes per row: width x channels elements, rounded up to the alignment.
  uint32_t rowStride() const { return rowStride_; }
  bool hasData() const { return data_ != nullptr; }

  // The pixel layout changes, so the old buffer is meaningless: release it.
  void setChannels(uint8_t channels) {
    release();
    channels_ = channels;
  }
  void setAlignment(uint8_t alignment) {
    release();
    alignment_ = alignment;
  }
  // Allocates a fresh buffer of the current geometry.
  void create(uint32_t width, uint32_t height) {
    width_ = width;
    height_ = height;
    allocate();
  }

  T* row(uint32_t y) { return reinterpret_cast<T*>(data_.get() + std::size_t(y) * rowStride_); }
  const T* row(uint32_t y) const {
    return reinterpret_cast<const T*>(data_.get() + std::size_t(y) * rowStride_);
  }

 private:
  std::size_t byteCount() const { return std::size_t(rowStride_) * height_; }

  void release() {
    data_.reset();
    rowStride_ = 0;
  }

  void allocate() {
    release();
    const uint64_t align = std::max<uint8_t>(alignment_, 1);
    const uint64_t raw = uint64_t(width_) * channels_ * sizeof(T);
    const uint64_t stride = (raw + align - 1) / align * align;
    if (stride > std::numeric_limits<uint32_t>::max()) {
      throw std::length_error("image row too long");
    }
    rowStride_ = static_cast<uint32_t>(stride);
    if (byteCount() > 0) data_.reset(new uint8_t[byteCount()]());
  }

  uint32_t width_ = 0;
  uint32_t height_ = 0;
  uint8_t channels_ = 1;
  uint8_t alignment_ = 1;
  uint32_t rowStride_ = 0;
  std::unique_ptr<uint8_t[]> data_;
};

using GreyImage = ImageTemplate<uint8_t>;

// The region must be non-empty and lie inside an image that has data in 1 or 3 channels.
template <typename T>
void validateRegion(const ImageTemplate<T>& image, uint32_t x, uint32_t y, uint32_t width,
                    uint32_t height) {
  const bool ok = image.hasData() && (image.channels() == 1 || image.channels() == 3) &&
                  width != 0 && height != 0 && uint64_t(x) + width <= image.width() &&
                  uint64_t(y) + height <= image.height();
  if (!ok) throw imageException("Bad input parameters in image function");
}

template <typename T>
void requireGrey(const ImageTemplate<T>& image) {
  if (image.channels() != 1) {
    throw imageException(
        "Bad input parameters in image function: gray-scaled image has more than 1 color "
        "channels");
  }
}

// Both checks of a grey-image function working on a region.
template <typename T>
void validateGreyRegion(const ImageTemplate<T>& image, uint32_t x, uint32_t y, uint32_t width,
                        uint32_t height) {
  validateRegion(image, x, y, width, height);
  requireGrey(image);
}

}  // namespace blobkit
