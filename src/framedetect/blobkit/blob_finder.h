// Blob labelling of grey images: 8-connected flood fill of the pixels at or above a level,
// with each blob's pixels, border pixels and outline.
#pragma once

#include <array>
#include <cstdint>
#include <list>
#include <vector>

#include "framedetect/blobkit/image_template.h"

namespace blobkit {

// Right and bottom are exclusive (largest x + 1, largest y + 1).
struct BlobBounds {
  uint32_t left = 0;
  uint32_t right = 0;
  uint32_t top = 0;
  uint32_t bottom = 0;
};

// Blob properties selectable by code, for largestBlob and the criteria filters.
enum BlobProperty : int {
  BlobProperty_Width = 0,         // right - left
  BlobProperty_Height = 1,        // bottom - top
  BlobProperty_BoxArea = 2,       // width x height
  BlobProperty_OutlineLength = 3, // outline points
  BlobProperty_PixelCount = 4,    // size()
  BlobProperty_BorderCount = 5,   // border points
};
constexpr int kBlobPropertyCount = 6;

class BlobRecord {
 public:
  // Image coordinates: every pixel in discovery order, the traced outline, and the pixels
  // with fewer than 8 foreground neighbours.
  std::vector<uint32_t> pixelX, pixelY;
  std::vector<uint32_t> outlineX, outlineY;
  std::vector<uint32_t> borderX, borderY;

  std::size_t size() const { return pixelX.size(); }
  // Computed on first request.
  const BlobBounds& bounds() const;
  // The property of the given code; imageException "Bad criterion for blob finding" otherwise.
  uint64_t property(int code) const;

 private:
  mutable BlobBounds bounds_;
  mutable bool haveBounds_ = false;
};

struct BlobLimit {
  bool checkMin = false;
  uint64_t min = 0;
  bool checkMax = false;
  uint64_t max = 0;
};

// One limit per property code; by default nothing is checked.
struct BlobCriteria {
  std::array<BlobLimit, kBlobPropertyCount> limits{};
};

class BlobFinder {
 public:
  // Labels the blobs of pixels >= level in the region, replacing those of a previous call,
  // then drops the blobs outside the checked limits.
  void find(const GreyImage& image, uint32_t x, uint32_t y, uint32_t width, uint32_t height,
            const BlobCriteria& criteria, uint8_t level);
  void find(const GreyImage& image, const BlobCriteria& criteria, uint8_t level);

  const std::list<BlobRecord>& blobs() const { return blobs_; }
  // The first blob with the largest value of the property; nullptr when there is none.
  const BlobRecord* largestBlob(int criterion) const;

 private:
  std::list<BlobRecord> blobs_;
};

}  // namespace blobkit
