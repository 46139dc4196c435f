#include "framedetect/blobkit/histogram.h"

namespace blobkit {

void computeHistogram(const GreyImage& image, uint32_t x, uint32_t y, uint32_t width,
                      uint32_t height, std::vector<uint32_t>& histogram) {
  validateGreyRegion(image, x, y, width, height);
  histogram.assign(256, 0);
  for (uint32_t r = y; r < y + height; ++r) {
    const uint8_t* p = image.row(r) + x;
    for (uint32_t c = 0; c < width; ++c) ++histogram[p[c]];
  }
}

void computeHistogram(const GreyImage& image, std::vector<uint32_t>& histogram) {
  computeHistogram(image, 0, 0, image.width(), image.height(), histogram);
}

uint8_t otsuThreshold(const std::vector<uint32_t>& histogram) {
  if (histogram.size() != 256) throw imageException("Histogram size is not 256");
  uint64_t total = 0;
  uint64_t totalSum = 0;
  for (uint32_t v = 0; v < 256; ++v) {
    total += histogram[v];
    totalSum += uint64_t(v) * histogram[v];
  }
  double best = -1.0;
  uint8_t threshold = 0;
  uint64_t n = 0;
  uint64_t s = 0;
  for (uint32_t t = 0; t < 256; ++t) {
    n += histogram[t];
    s += uint64_t(t) * histogram[t];
    if (total - n == 0) break;
    if (n == 0) continue;
    const double w = double(n) / double(total);
    const double m0 = double(s) / double(n);
    const double m1 = double(totalSum - s) / double(total - n);
    const double d = m0 - m1;
    const double score = (1.0 - w) * w * (d * d);
    if (score > best) {
      best = score;
      threshold = static_cast<uint8_t>(t);
    }
  }
  return threshold;
}

}  // namespace blobkit
