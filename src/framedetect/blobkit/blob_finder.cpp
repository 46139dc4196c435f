#include "framedetect/blobkit/blob_finder.h"

#include <algorithm>

namespace blobkit {

namespace {

constexpr uint8_t kBackground = 0;
constexpr uint8_t kForeground = 1;
constexpr uint8_t kLabelled = 2;
constexpr uint8_t kBorder = 3;
constexpr uint8_t kOutline = 4;

struct Points {
  std::vector<uint32_t> xs, ys;
  std::size_t size() const { return xs.size(); }
  void reserve(std::size_t n) {
    xs.reserve(n);
    ys.reserve(n);
  }
  void clear() {
    xs.clear();
    ys.clear();
  }
  void push_back(uint32_t px, uint32_t py) {
    xs.push_back(px);
    ys.push_back(py);
  }
  void copyTo(std::vector<uint32_t>& outX, std::vector<uint32_t>& outY) const {
    outX.assign(xs.begin(), xs.end());
    outY.assign(ys.begin(), ys.end());
  }
};

void checkCriterion(int code) {
  if (code < 0 || code >= kBlobPropertyCount) {
    throw imageException("Bad criterion for blob finding");
  }
}

}  // namespace

const BlobBounds& BlobRecord::bounds() const {
  if (!haveBounds_ && !pixelX.empty()) {
    const auto [minX, maxX] = std::minmax_element(pixelX.begin(), pixelX.end());
    const auto [minY, maxY] = std::minmax_element(pixelY.begin(), pixelY.end());
    bounds_ = BlobBounds{*minX, *maxX + 1, *minY, *maxY + 1};
    haveBounds_ = true;
  }
  return bounds_;
}

uint64_t BlobRecord::property(int code) const {
  checkCriterion(code);
  switch (code) {
    case BlobProperty_Width: return bounds().right - bounds().left;
    case BlobProperty_Height: return bounds().bottom - bounds().top;
    case BlobProperty_BoxArea:
      return uint64_t(bounds().right - bounds().left) * (bounds().bottom - bounds().top);
    case BlobProperty_OutlineLength: return outlineX.size();
    case BlobProperty_PixelCount: return pixelX.size();
    default: return borderX.size();
  }
}

void BlobFinder::find(const GreyImage& image, const BlobCriteria& criteria, uint8_t level) {
  find(image, 0, 0, image.width(), image.height(), criteria, level);
}

void BlobFinder::find(const GreyImage& image, uint32_t x, uint32_t y, uint32_t width,
                      uint32_t height, const BlobCriteria& criteria, uint8_t level) {
  validateGreyRegion(image, x, y, width, height);
  blobs_.clear();

  // A one-cell frame of background around the region spares every bounds check.
  const std::size_t mapWidth = std::size_t(width) + 2;
  std::vector<uint8_t> map(mapWidth * (std::size_t(height) + 2), kBackground);
  std::size_t foreground = 0;
  for (uint32_t r = 0; r < height; ++r) {
    const uint8_t* src = image.row(y + r) + x;
    uint8_t* dst = map.data() + (r + 1) * mapWidth + 1;
    for (uint32_t c = 0; c < width; ++c) {
      const bool on = src[c] >= level;
      dst[c] = on ? kForeground : kBackground;
      foreground += on;
    }
  }

  // Up-left, up, up-right, left, right, down-left, down, down-right.
  const std::ptrdiff_t w = static_cast<std::ptrdiff_t>(mapWidth);
  const std::ptrdiff_t neighbours[8] = {-w - 1, -w, -w + 1, -1, 1, w - 1, w, w + 1};
  const uint32_t stepX[8] = {~0u, 0, 1, ~0u, 1, ~0u, 0, 1};  // ~0u: minus one, modulo 2^32
  const uint32_t stepY[8] = {~0u, ~0u, ~0u, 0, 0, 1, 1, 1};
  // Map coordinates are image coordinates shifted by the frame and the region origin.
  auto cellOf = [&](uint32_t px, uint32_t py) {
    return std::size_t(py - y + 1) * mapWidth + (px - x + 1);
  };

  // Scratch lists reused from blob to blob, so that each blob's own lists are allocated
  // once, at their final size.
  Points pixels, border, outline;
  pixels.reserve(foreground);
  for (std::size_t start = 0; start < map.size(); ++start) {
    if (map[start] != kForeground) continue;
    pixels.clear();
    border.clear();
    outline.clear();
    const auto startX = static_cast<uint32_t>(start % mapWidth - 1 + x);
    const auto startY = static_cast<uint32_t>(start / mapWidth - 1 + y);
    pixels.push_back(startX, startY);
    map[start] = kLabelled;
    for (std::size_t i = 0; i < pixels.size(); ++i) {
      const uint32_t px = pixels.xs[i];
      const uint32_t py = pixels.ys[i];
      const std::size_t cell = cellOf(px, py);
      int counted = 0;
      for (int k = 0; k < 8; ++k) {
        uint8_t& n = map[cell + neighbours[k]];
        if (n == kForeground) {
          pixels.push_back(px + stepX[k], py + stepY[k]);
          n = kLabelled;
        }
        if (n > kBackground) ++counted;
      }
      if (counted < 8) {
        border.push_back(px, py);
        map[cell] = kBorder;
      }
    }

    // The outline: a walk over border cells from the first point (always a border point, as
    // the scan meets it first), taking the first unvisited border neighbour in the order above.
    std::size_t cell = start;
    uint32_t ox = startX;
    uint32_t oy = startY;
    while (true) {
      map[cell] = kOutline;
      outline.push_back(ox, oy);
      int next = -1;
      for (int k = 0; k < 8 && next < 0; ++k) {
        if (map[cell + neighbours[k]] == kBorder) next = k;
      }
      if (next < 0) break;
      cell += neighbours[next];
      ox += stepX[next];
      oy += stepY[next];
    }

    BlobRecord& blob = blobs_.emplace_back();
    pixels.copyTo(blob.pixelX, blob.pixelY);
    border.copyTo(blob.borderX, blob.borderY);
    outline.copyTo(blob.outlineX, blob.outlineY);
  }

  for (int code = 0; code < kBlobPropertyCount; ++code) {
    const BlobLimit& limit = criteria.limits[code];
    if (!limit.checkMin && !limit.checkMax) continue;
    blobs_.remove_if([&](const BlobRecord& blob) {
      const uint64_t v = blob.property(code);
      return (limit.checkMin && v < limit.min) || (limit.checkMax && v > limit.max);
    });
  }
}

const BlobRecord* BlobFinder::largestBlob(int criterion) const {
  checkCriterion(criterion);
  const BlobRecord* best = nullptr;
  uint64_t bestValue = 0;
  for (const BlobRecord& blob : blobs_) {
    const uint64_t v = blob.property(criterion);
    if (best == nullptr || v > bestValue) {
      best = &blob;
      bestValue = v;
    }
  }
  return best;
}

}  // namespace blobkit
