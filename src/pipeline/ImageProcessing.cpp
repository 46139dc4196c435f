// The drivers that run lane and band detection, band update and quantification over every
// frame and channel of a capture. Each channel file is loaded once per call and kept in
// memory; one detector is created per frame and channel and dropped after it.
#include "pipeline/ImageProcessing.h"

#include <algorithm>
#include <ctime>

#include "common/channel_files.h"
#include "common/checked.h"
#include "common/log.h"
#include "detector/BandLaneDetectionImpl.h"
#include "pipeline/lane_merge.h"
#include "viraduve/Exception.h"

namespace viraduve {
namespace ImageProcessing {

namespace {

// Half-size of the top-hat element that quantification uses as rolling background.
constexpr int32_t kRollingRadius = 30;

const char kFile[] = "DaduZerovoVur\\ImageProcessing";

void logInput(const char* startLine, const char* dirLabel, const std::string& imageDir,
              const std::vector<ImageParam>& params, ImageMode mode) {
  logLine(startLine);
  logLine("Input: ");
  logLine(dirLabel, imageDir);
  for (const ImageParam& p : params) printImageParam(p);
  logLine("image_mode: ", imageModeName(mode));
}

ROI wholeImage(const Image& image) { return ROI{0, 0, image.cols() - 1, image.rows() - 1}; }

void clampInto(int32_t& x1, int32_t& y1, int32_t& x2, int32_t& y2, const ROI& frame) {
  x1 = std::max(x1, frame.x1);
  y1 = std::max(y1, frame.y1);
  x2 = std::min(x2, frame.x2);
  y2 = std::min(y2, frame.y2);
}

}  // namespace

std::vector<Lane2D> mergeChannelLanes(const std::vector<std::vector<Lane2D>>& perChannel) {
  std::vector<Lane2D> merged = at(perChannel, 0);
  for (std::size_t c = 1; c < perChannel.size(); ++c) {
    for (std::size_t j = 0; j < merged.size(); ++j) {
      const std::vector<Band2D>& bands = at(perChannel[c], j).bands;
      merged[j].bands.insert(merged[j].bands.end(), bands.begin(), bands.end());
    }
  }
  return merged;
}

void clampLanesInto(std::vector<Lane2D>& lanes, const ROI& frame) {
  for (Lane2D& lane : lanes) {
    clampInto(lane.x1, lane.y1, lane.x2, lane.y2, frame);
    for (Band2D& band : lane.bands) clampInto(band.x1, band.y1, band.x2, band.y2, frame);
  }
}

void runBandLandeDetection(const std::string& imageDir, LanesPerFrame& lanesPerFrame,
                           const std::vector<ROI>& rois, const std::vector<ImageParam>& params,
                           ImageMode mode) {
  const std::clock_t start = std::clock();
  logInput("In ImageProcessing::runBandLandeDetection().", "image_dir: ", imageDir, params, mode);

  const std::vector<std::string> files = listChannelFiles(imageDir);
  logLine("Num of raw images = ", files.size());
  if (files.size() != params.size()) {
    throw Exception(-4, "ERROR! Number of image files is not equal to number of image parameter set",
                    "ImageProcessing::runBandLandeDetection", kFile, 313);
  }

  std::vector<Image> images;
  images.reserve(files.size());
  images.emplace_back(imageDir, at(files, 0));
  const int refCols = images[0].cols();
  const int refRows = images[0].rows();
  std::vector<int> defaults;
  setRawImageDefaultBackground(mode, params, defaults, false);

  for (std::size_t i = 0; i < files.size(); ++i) {
    if (i > 0) images.emplace_back(imageDir, files[i]);
    Image& image = images[i];
    if (invertForDetection(mode, defaults, params, i)) {
      invertChannelImage(image, image, 65535);
      logLine("invert ch ", i, " to get white signal for band lane detection ");
    }
    logLine("image_temp parameter: ", "cols = ", image.cols(), ", rows = ", image.rows(),
            ", exposureTime = ", image.exposureTime());
    if (image.cols() != refCols || image.rows() != refRows) {
      throw Exception(-4, "ERROR! Size of images are different!",
                      "ImageProcessing::runBandLandeDetection", kFile, 353);
    }
  }

  Image overlay;
  computeImageForLaneDetection(images, mode, params, overlay);
  logLine("Image overlay is done.");
  logLine("img_overlay parameters: ", "cols = ", overlay.cols(), ", rows = ", overlay.rows());

  logLine("lane detections for all frames is started");
  LanesPerFrame lanesFound;
  for (std::size_t f = 0; f < rois.size(); ++f) {
    logLine("lane detection for frame ", f);
    ROI frame = rois[f];
    frame.x1 = std::max(frame.x1, 0);
    frame.y1 = std::max(frame.y1, 0);
    frame.x2 = std::min(frame.x2, overlay.cols() - 1);
    frame.y2 = std::min(frame.y2, overlay.rows() - 1);
    printROI(frame);
    BandLaneDetectionImpl detector;
    std::vector<Lane2D> lanes;
    detector.detect(overlay, frame, lanes);
    lanesFound.push_back(std::move(lanes));
  }
  logLine("lane detection for all frames is finished");

  for (std::size_t f = 0; f < rois.size(); ++f) {
    const ROI& frame = rois[f];
    logLine("lines_h_current_frame_temp.size(): ", lanesFound[f].size());
    std::vector<std::vector<Lane2D>> perChannel;
    for (std::size_t c = 0; c < images.size(); ++c) {
      logLine("Band detection for frame_", f, ", channel_", c);
      BandLaneDetectionImpl detector;
      std::vector<Lane2D> lanes;
      detector.detect_new(images[c], frame, lanesFound[f], static_cast<uint32_t>(c), lanes);
      clampLanesInto(lanes, frame);
      for (std::size_t j = 0; j < lanes.size(); ++j) {
        const Lane2D& lane = lanes[j];
        logLine("lane_", j, "_final: ");
        printLane2D(lane);
        for (std::size_t k = 0; k < lane.bands.size(); ++k) {
          logLine("band_", k, "_final: ");
          printBand2D(lane.bands[k]);
        }
      }
      perChannel.push_back(std::move(lanes));
    }
    lanesPerFrame.push_back(mergeChannelLanes(perChannel));
  }

  logLine("In ImageProcessing::runBandLandeDetection().");
  logLine("Time taken: ", secondsSince(start));
}

void updateBandDetection(const std::string& imageDir, LanesPerFrame& lanesPerFrame,
                         const std::vector<ImageParam>& params, ImageMode mode) {
  const std::clock_t start = std::clock();
  logInput("ImageProcessing::updateBandDetection is started.", "imageDirectory: ", imageDir,
           params, mode);

  const std::vector<Image> images = loadChannelsForAnalysis(imageDir, params, mode);
  if (images.size() != params.size()) {
    throw Exception(-4,
                    "ERROR in updateBandDetection()! Image File Number is Not Equal to Image "
                    "Parameter Number",
                    "ImageProcessing::updateBandDetection", kFile, 600);
  }

  for (std::size_t f = 0; f < lanesPerFrame.size(); ++f) {
    std::vector<std::vector<Lane2D>> perChannel;
    for (std::size_t c = 0; c < images.size(); ++c) {
      logLine("update bandlane in frame_", f, ", channel_", c);
      BandLaneDetectionImpl detector;
      std::vector<Lane2D> lanes;
      detector.detect_new(images[c], wholeImage(images[c]), lanesPerFrame[f],
                          static_cast<uint32_t>(c), lanes);
      perChannel.push_back(std::move(lanes));
    }
    lanesPerFrame[f] = mergeChannelLanes(perChannel);
  }

  logLine("ImageProcessing::updateBandDetection is finished.");
  logLine("Time taken: ", secondsSince(start));
}

void runBandLandeAnalysis(const std::string& imageDir, LanesPerFrame& lanesPerFrame,
                          const std::vector<ImageParam>& params, ImageMode mode) {
  const std::clock_t start = std::clock();
  logInput("ImageProcessing::runBandLandeAnalysis 1 is started.", "image_dir: ", imageDir,
           params, mode);

  const std::vector<Image> images = loadChannelsForAnalysis(imageDir, params, mode);

  for (std::size_t c = 0; c < images.size(); ++c) {
    for (std::vector<Lane2D>& lanes : lanesPerFrame) {
      BandLaneDetectionImpl detector;
      detector.analyis(images[c], lanes, static_cast<uint32_t>(c), wholeImage(images[c]),
                       kRollingRadius);
    }
  }

  logLine("ImageProcessing::runBandLandeAnalysis 1 is finished.");
  logLine("Time taken: ", secondsSince(start));
}

}  // namespace ImageProcessing
}  // namespace viraduve
