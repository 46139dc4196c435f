#include "framedetect/blobkit/threshold.h"

namespace blobkit {

void thresholdImage(const GreyImage& in, GreyImage& out, uint8_t threshold) {
  validateGreyRegion(in, 0, 0, in.width(), in.height());
  GreyImage result(in.width(), in.height(), 1, in.alignment());
  for (uint32_t r = 0; r < in.height(); ++r) {
    const uint8_t* src = in.row(r);
    uint8_t* dst = result.row(r);
    for (uint32_t c = 0; c < in.width(); ++c) dst[c] = src[c] < threshold ? 0 : 255;
  }
  out = std::move(result);
}

}  // namespace blobkit
