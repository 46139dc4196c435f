// Region analysis drivers: every channel of the capture measures its own regions, with the
// whole image, a rectangle or a circle as the global-background area.
#include <functional>

#include "common/channel_files.h"
#include "common/log.h"
#include "detector/BandLaneDetectionImpl.h"
#include "pipeline/ImageProcessing.h"

namespace viraduve {
namespace ImageProcessing {

namespace {

// The rolling-ball (top-hat) radius of the region measures.
constexpr int32_t kRegionRollingRadius = 30;

using MeasureChannel =
    std::function<void(BandLaneDetectionImpl& detector, const Image& image, uint32_t channel)>;

// Loads and orients every channel like the analysis driver, then measures channel by channel
// with a fresh detector. The channel's display parameters (range, gamma) only shape what is
// shown; the measures read the oriented channel image itself, so no adjustment is applied.
void measureAllChannels(const std::string& imageDir, const std::vector<ImageParam>& imageParams,
                        ImageMode imgMode, const MeasureChannel& measure) {
  const std::vector<Image> images = loadChannelsForAnalysis(imageDir, imageParams, imgMode);
  for (std::size_t c = 0; c < images.size(); ++c) {
    BandLaneDetectionImpl detector;
    measure(detector, images[c], static_cast<uint32_t>(c));
  }
}

}  // namespace

void runRegionAnalysis(const std::string& imageDir, std::vector<Region2D>& regions,
                       const std::vector<ImageParam>& imageParams, ImageMode imgMode) {
  measureAllChannels(imageDir, imageParams, imgMode,
                     [&](BandLaneDetectionImpl& detector, const Image& image, uint32_t c) {
                       const ROI whole{0, 0, image.cols() - 1, image.rows() - 1};
                       detector.analyis(image, regions, c, whole, kRegionRollingRadius);
                     });
}

void runRegionAnalysisRectBackground(const std::string& imageDir, std::vector<Region2D>& regions,
                                     const std::vector<ImageParam>& imageParams,
                                     ImageMode imgMode, const ROI& bgRect) {
  measureAllChannels(imageDir, imageParams, imgMode,
                     [&](BandLaneDetectionImpl& detector, const Image& image, uint32_t c) {
                       detector.analyis(image, regions, c, bgRect, kRegionRollingRadius);
                     });
}

void runRegionAnalysisCircleBackground(const std::string& imageDir,
                                       std::vector<Region2D>& regions,
                                       const std::vector<ImageParam>& imageParams,
                                       ImageMode imgMode, const Circle& bgCircle) {
  measureAllChannels(imageDir, imageParams, imgMode,
                     [&](BandLaneDetectionImpl& detector, const Image& image, uint32_t c) {
                       detector.analyis(image, regions, c, bgCircle, kRegionRollingRadius);
                     });
}

}  // namespace ImageProcessing
}  // namespace viraduve
