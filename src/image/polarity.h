// Channel polarity: which channels are inverted so that signal is bright on dark, and the
// composed lane-detection image.
#pragma once

#include <string>
#include <vector>

#include "viraduve/Image.h"
#include "viraduve/records.h"

namespace viraduve {
namespace ImageProcessing {

// Default background per channel: 1 bright, -1 dark, 0 never inverted.
void setRawImageDefaultBackground(ImageMode mode, const std::vector<ImageParam>& params,
                                  std::vector<int>& defaultBackgrounds, bool visIsBright);

// Composes the 16-bit lane-detection image of the (polarity-corrected) channel images.
void computeImageForLaneDetection(const std::vector<Image>& images, ImageMode mode,
                                  const std::vector<ImageParam>& params, Image& composed);

}  // namespace ImageProcessing

// Whether channel i is inverted under the analysis rule (runBandLandeAnalysis,
// updateBandDetection, total-protein, rolling-ball and region drivers).
// defaultBackgrounds and params are indexed with bounds checks.
bool invertForAnalysis(ImageMode mode, const std::vector<int>& defaultBackgrounds,
                       const std::vector<ImageParam>& params, std::size_t channel);
// Whether channel i is inverted under the detection rule (runBandLandeDetection).
bool invertForDetection(ImageMode mode, const std::vector<int>& defaultBackgrounds,
                        const std::vector<ImageParam>& params, std::size_t channel);

// Loads every channel file of imageDir (byte-wise name order) and inverts those the analysis
// rule selects, logging "invert ch <i>for band lane detection ". A folder without channel
// files raises the loading error of a missing "ch0.tif".
std::vector<Image> loadChannelsForAnalysis(const std::string& imageDir,
                                           const std::vector<ImageParam>& params,
                                           ImageMode mode);

}  // namespace viraduve
