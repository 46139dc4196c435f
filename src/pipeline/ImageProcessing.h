// The drivers that run one analysis step over every frame and channel of a capture.
#pragma once

#include <string>
#include <vector>

#include "image/polarity.h"
#include "viraduve/BandLaneDetection.h"
#include "viraduve/Image.h"
#include "viraduve/records.h"

namespace viraduve {
namespace ImageProcessing {

using LanesPerFrame = std::vector<std::vector<Lane2D>>;

// Lane and band detection in each frame of rois; appends one lane list per frame.
void runBandLandeDetection(const std::string& imageDir, LanesPerFrame& lanesPerFrame,
                           const std::vector<ROI>& rois, const std::vector<ImageParam>& params,
                           ImageMode mode);
// Finds the bands of the given lanes again; replaces each frame's lane list.
void updateBandDetection(const std::string& imageDir, LanesPerFrame& lanesPerFrame,
                         const std::vector<ImageParam>& params, ImageMode mode);
// Measures every band of every channel in place.
void runBandLandeAnalysis(const std::string& imageDir, LanesPerFrame& lanesPerFrame,
                          const std::vector<ImageParam>& params, ImageMode mode);
// Frame detection on channel 0; rois receives the frames found.
void runAnalysisFrameDetection(const std::string& imageDir, std::vector<ROI>& rois,
                               const std::vector<ImageParam>& params, ImageMode mode);

// Total-protein normalisation factors of the lanes of allBandlanes.
void computeAllNormFactor(const std::string& imageDir, ImageMode imgMode,
                          std::vector<ImageParam> imageParams, int normalizationChannelIndex,
                          const std::vector<VerticalRange>& verticalRanges,
                          LanesPerFrame& allBandlanes,
                          std::vector<std::vector<double>>& allNormFactor,
                          std::vector<std::vector<double>>& allLaneVolume,
                          std::vector<std::vector<double>>& allLaneBackgroundVolume,
                          std::vector<std::vector<double>>& allLaneAdjustedVolume,
                          double digitalZoom, double opticalZoom, uint32_t binning);
// Divides every band measure of each lane by the lane's factor.
void applyNormalization(LanesPerFrame& allBandlanes,
                        const std::vector<std::vector<double>>& allNormFactor);

// Region analysis with the whole image, a rectangle or a circle as global background.
void runRegionAnalysis(const std::string& imageDir, std::vector<Region2D>& regions,
                       const std::vector<ImageParam>& imageParams, ImageMode imgMode);
void runRegionAnalysisRectBackground(const std::string& imageDir, std::vector<Region2D>& regions,
                                     const std::vector<ImageParam>& imageParams,
                                     ImageMode imgMode, const ROI& bgRect);
void runRegionAnalysisCircleBackground(const std::string& imageDir,
                                       std::vector<Region2D>& regions,
                                       const std::vector<ImageParam>& imageParams,
                                       ImageMode imgMode, const Circle& bgCircle);

}  // namespace ImageProcessing
}  // namespace viraduve
