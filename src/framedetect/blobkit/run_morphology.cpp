#include "framedetect/blobkit/run_morphology.h"

#include <algorithm>
#include <vector>

namespace blobkit {

namespace {

// A transition is a pixel that differs from the expected value; the expected value then flips
// bitwise, which for binary images is the value of the new run.
void rowPass(GreyImage& image, uint32_t s, uint8_t fill) {
  const uint32_t width = image.width();
  std::vector<uint32_t> transitions;
  for (uint32_t r = 0; r < image.height(); ++r) {
    uint8_t* p = image.row(r);
    transitions.clear();
    uint8_t expected = p[0];
    for (uint32_t c = 1; c < width; ++c) {
      if (p[c] != expected) {
        transitions.push_back(c);
        expected = static_cast<uint8_t>(~expected);
      }
    }
    for (uint32_t t : transitions) {
      const uint32_t begin = t >= s ? t - s : 0;
      const uint32_t end = std::min(t + s, width);
      std::fill(p + begin, p + end, fill);
    }
  }
}

// Columns are scanned together row by row (cache friendly); each column's transitions are
// all collected before any of its windows is filled, as in the row pass.
void columnPass(GreyImage& image, uint32_t s, uint8_t fill) {
  const uint32_t width = image.width();
  const uint32_t height = image.height();
  std::vector<uint8_t> expected(image.row(0), image.row(0) + width);
  std::vector<std::vector<uint32_t>> transitions(width);
  for (uint32_t r = 1; r < height; ++r) {
    const uint8_t* p = image.row(r);
    for (uint32_t c = 0; c < width; ++c) {
      if (p[c] != expected[c]) {
        transitions[c].push_back(r);
        expected[c] = static_cast<uint8_t>(~expected[c]);
      }
    }
  }
  for (uint32_t c = 0; c < width; ++c) {
    for (uint32_t t : transitions[c]) {
      const uint32_t begin = t >= s ? t - s : 0;
      const uint32_t end = std::min(t + s, height);
      for (uint32_t r = begin; r < end; ++r) image.row(r)[c] = fill;
    }
  }
}

void morphRuns(GreyImage& image, uint32_t sizeX, uint32_t sizeY, uint8_t fill) {
  validateGreyRegion(image, 0, 0, image.width(), image.height());
  const uint32_t sX = std::min(image.width() / 2, sizeX);
  const uint32_t sY = std::min(image.height() / 2, sizeY);
  if (sX != 0) rowPass(image, sX, fill);
  if (sY != 0) columnPass(image, sY, fill);
}

}  // namespace

void erodeRuns(GreyImage& image, uint32_t sizeX, uint32_t sizeY) {
  morphRuns(image, sizeX, sizeY, 0);
}

void dilateRuns(GreyImage& image, uint32_t sizeX, uint32_t sizeY) {
  morphRuns(image, sizeX, sizeY, 255);
}

}  // namespace blobkit
