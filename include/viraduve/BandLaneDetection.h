// The lane and band detector for C++ hosts: one object per frame of a capture.
#pragma once

#include <array>
#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "viraduve/Exception.h"
#include "viraduve/Image.h"
#include "viraduve/export.h"
#include "viraduve/records.h"

namespace viraduve {

// Rows between which every lane of one frame is measured by total-protein normalisation.
using VerticalRange = std::array<uint32_t, 2>;

class VIRADUVE_EXPORT BandLaneDetection {
 public:
  // Finds the lanes of frame (image pixels, inclusive) and their bands, in image coordinates.
  virtual void detect(const Image& image, const ROI& frame, std::vector<Lane2D>& lanes) = 0;
  // Finds the bands of the given lanes again; new bands are stamped with channel.
  virtual void detect_new(const Image& image, const ROI& frame, const std::vector<Lane2D>& lanesIn,
                          uint32_t channel, std::vector<Lane2D>& lanesOut) = 0;
  // Region measures, global background from a circle or a rectangle.
  virtual void analyis(const Image& image, std::vector<Region2D>& regions, uint32_t channel,
                       const Circle& gbCircle, int32_t radius) = 0;
  virtual void analyis(const Image& image, std::vector<Region2D>& regions, uint32_t channel,
                       const ROI& gbRoi, int32_t radius) = 0;
  // Band measures of the lanes, global background from a circle or a rectangle.
  virtual void analyis(const Image& image, std::vector<Lane2D>& lanes, uint32_t channel,
                       const Circle& gbCircle, int32_t radius) = 0;
  virtual void analyis(const Image& image, std::vector<Lane2D>& lanes, uint32_t channel,
                       const ROI& gbRoi, int32_t radius) = 0;
  // Counts the lanes whose direction lies within [minAngle, maxAngle] degrees (mod 180);
  // appends the others to outside.
  virtual uint32_t countLanesWithinAngle(const std::vector<Lane2D>& lanes,
                                         std::vector<Lane2D>& outside, float minAngle,
                                         float maxAngle) = 0;
  virtual uint32_t countLanesWithinAngle2(const std::vector<Lane2D>& lanes,
                                          std::vector<Lane2D>& outside, float minAngle,
                                          float maxAngle) = 0;
  // Total-protein measurement: one list per frame appended to each output.
  virtual void computeAllNormFactor(const Image& image,
                                    const std::vector<VerticalRange>& verticalRanges,
                                    std::vector<std::vector<Lane2D>>& allBandlanes,
                                    int32_t rbRadius, double widthRatio,
                                    std::vector<std::vector<double>>& allNormFactor,
                                    std::vector<std::vector<double>>& allLaneVolume,
                                    std::vector<std::vector<double>>& allLaneBackgroundVolume,
                                    std::vector<std::vector<double>>& allLaneAdjustedVolume) = 0;
  // Shows frame and lanes in a window (needs a display; raises viraduve::Exception without).
  virtual void drawLaneBands(const Image& image, const ROI& frame,
                             const std::vector<Lane2D>& lanes, const std::string& windowName) = 0;
  // The same with the boxes of the bands whose score is not below bandThreshold.
  virtual void drawLaneBands(const Image& image, const ROI& frame,
                             const std::vector<Lane2D>& lanes, double bandThreshold,
                             const std::string& windowName) = 0;
  // Writes the drawing of frame (blue), lanes (green) and bands (red) to path.
  virtual void saveLaneBands(const Image& image, const ROI& frame,
                             const std::vector<Lane2D>& lanes, double bandThreshold,
                             const std::string& path) = 0;
  // Writes a drawing of the total-protein layout: lanes, vertical range and factors.
  virtual void saveTPNImage(const Image& image, const ROI& frame, const std::vector<Lane2D>& lanes,
                            const VerticalRange& verticalRange,
                            const std::vector<double>& normFactors, const std::string& path) = 0;
  virtual ~BandLaneDetection();
};

// A new detector (background_ = -1).
VIRADUVE_EXPORT std::unique_ptr<BandLaneDetection> createBandLaneDetection();

}  // namespace viraduve
