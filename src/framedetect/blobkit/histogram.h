// Grey-level histogram of an image region and its Otsu threshold.
#pragma once

#include <cstdint>
#include <vector>

#include "framedetect/blobkit/image_template.h"

namespace blobkit {

// 256 counts of the grey values in the region (histogram is resized and zeroed first).
void computeHistogram(const GreyImage& image, uint32_t x, uint32_t y, uint32_t width,
                      uint32_t height, std::vector<uint32_t>& histogram);
void computeHistogram(const GreyImage& image, std::vector<uint32_t>& histogram);

// The first level t with the largest between-class score, the classes being v <= t and
// v > t; 0 when no level splits the histogram. Throws unless it has 256 bins.
uint8_t otsuThreshold(const std::vector<uint32_t>& histogram);

}  // namespace blobkit
