// Run-based erosion and dilation of binary (0 / 255) grey images, in place.
#pragma once

#include <cstdint>

#include "framedetect/blobkit/image_template.h"

namespace blobkit {

// Every transition between runs, along rows then along columns, blackens a window of
// min(width / 2, sizeX) pixels on each side (min(height / 2, sizeY) along columns).
void erodeRuns(GreyImage& image, uint32_t sizeX, uint32_t sizeY);
// The same with white: white runs widen by sizeX on each side horizontally, sizeY vertically.
void dilateRuns(GreyImage& image, uint32_t sizeX, uint32_t sizeY);

}  // namespace blobkit
