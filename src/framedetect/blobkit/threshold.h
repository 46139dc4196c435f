// Binary thresholding of a grey image.
#pragma once

#include <cstdint>

#include "framedetect/blobkit/image_template.h"

namespace blobkit {

// out (created with in's size) = 0 where in < threshold, else 255.
void thresholdImage(const GreyImage& in, GreyImage& out, uint8_t threshold);

}  // namespace blobkit
