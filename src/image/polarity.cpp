// Channel polarity: the default background of each channel per imaging mode, the two rules
// that decide which channel to invert, and the lane-detection image that combines the
// signal channels. Detection and quantification expect bright signal on a dark background.
#include "image/polarity.h"

#include <opencv2/core.hpp>

#include "common/channel_files.h"
#include "common/checked.h"
#include "common/log.h"
#include "viraduve/Exception.h"

namespace viraduve {
namespace ImageProcessing {

void setRawImageDefaultBackground(ImageMode mode, const std::vector<ImageParam>& params,
                                  std::vector<int>& defaultBackgrounds, bool visIsBright) {
  defaultBackgrounds.clear();
  const std::size_t n = params.size();
  switch (mode) {
    case ImageMode_Chemi:
    case ImageMode_Fluo:
      if (n < 2) {
        throw Exception(-4, "ERROR in setRawImageDefaultBackground! This mode needs at least 2 channels",
                        "setRawImageDefaultBackground", "DaduZerovoVur\\ImageProcessing", 148);
      }
      defaultBackgrounds.assign(n, -1);
      defaultBackgrounds[0] = 1;
      break;
    case ImageMode_Vis:
    case ImageMode_UV_WHITE:
      defaultBackgrounds.push_back(1);
      break;
    case ImageMode_UV:
    case ImageMode_Protein:
      defaultBackgrounds.push_back(-1);
      break;
    case ImageMode_Universal:
      if (n == 0) {
        defaultBackgrounds.push_back(0);
        break;
      }
      for (const ImageParam& p : params) {
        const bool bright = p.channelType == ChType_Live || p.channelType == ChType_Membrane ||
                            (p.channelType == ChType_Vis && visIsBright);
        defaultBackgrounds.push_back(bright ? 1 : -1);
      }
      break;
    default:
      defaultBackgrounds.push_back(0);
      break;
  }
}

namespace {

// Min-max normalisation of one channel; a flat picture is scaled by the full 16-bit range.
cv::Mat normalised(const Image& image) {
  cv::Mat f;
  image.mat().convertTo(f, CV_32F);
  double m = 0.0;
  double M = 0.0;
  cv::minMaxLoc(f, &m, &M);
  if (m == M) {
    m = 0.0;
    M = 65535.0;
  }
  cv::Mat n = (f - m) / (M - m);
  return n;
}

}  // namespace

void computeImageForLaneDetection(const std::vector<Image>& images, ImageMode mode,
                                  const std::vector<ImageParam>& /*params*/, Image& composed) {
  const Image& first = at(images, 0);
  cv::Mat acc(first.mat().size(), CV_32F, cv::Scalar(1.0));
  const bool singleChannelMode = mode == ImageMode_Vis || mode == ImageMode_UV ||
                                 mode == ImageMode_Protein || mode == ImageMode_UV_WHITE;
  if (singleChannelMode && images.size() >= 2) {
    throw Exception(-7, "ERROR! Image mode and channel mismatch!", "computeImageForLaneDetection",
                    "DaduZerovoVur\\ImageProcessing", 83);
  }
  cv::Mat result;
  if (images.size() >= 2) {
    // Image 0 (the bright-background channel of the multi-channel modes) takes no part.
    for (std::size_t i = 1; i < images.size(); ++i) {
      cv::Mat n = normalised(images[i]);
      n = cv::max(n, 0.0);
      n = cv::min(n, 1.0);
      acc = acc.mul(1.0 - n);
    }
    result = 65535.0 * (1.0 - acc);
  } else {
    result = 65535.0 * normalised(first);
  }
  cv::Mat out;
  result.convertTo(out, CV_16U);
  composed.setMat(out);
}

}  // namespace ImageProcessing

namespace {

bool invertFor(int defaultBackground, bool hostInverted) {
  return (defaultBackground == 1 && !hostInverted) || (defaultBackground == -1 && hostInverted);
}

}  // namespace

bool invertForAnalysis(ImageMode mode, const std::vector<int>& defaultBackgrounds,
                       const std::vector<ImageParam>& params, std::size_t channel) {
  const int b = at(defaultBackgrounds, channel);
  const bool h = mode == ImageMode_Universal && at(params, channel).backgroundInverted != 0;
  return invertFor(b, h);
}

bool invertForDetection(ImageMode mode, const std::vector<int>& defaultBackgrounds,
                        const std::vector<ImageParam>& params, std::size_t channel) {
  const int b = at(defaultBackgrounds, channel);
  bool h = false;
  if (mode == ImageMode_Universal) {
    const ImageParam& p = at(params, channel);
    h = p.backgroundInverted != 0;
    // Protein stains and visible-light channels report their inversion the other way round.
    if (p.channelType == ChType_Protein || p.channelType == ChType_Vis) h = !h;
  }
  return invertFor(b, h);
}

std::vector<Image> loadChannelsForAnalysis(const std::string& imageDir,
                                           const std::vector<ImageParam>& params,
                                           ImageMode mode) {
  const std::vector<std::string> files = listChannelFiles(imageDir);
  // A folder without channel files (or no folder at all) has nothing to measure: answering
  // with the request's own values would pass stale measures off as new ones.
  if (files.empty()) {
    logLine("Loaded Image Path is ", joinPath(imageDir, "ch0.tif"));
    throw Exception(-3, "ERROR! Image File Not Sucessfully Loaded", "viraduve::Image::_load",
                    "DaduZerovoVur\\Image", 203);
  }
  std::vector<int> defaults;
  ImageProcessing::setRawImageDefaultBackground(mode, params, defaults, false);
  std::vector<Image> images;
  images.reserve(files.size());
  for (std::size_t i = 0; i < files.size(); ++i) {
    images.emplace_back(imageDir, files[i]);
    if (invertForAnalysis(mode, defaults, params, i)) {
      invertChannelImage(images[i], images[i], 65535);
      logLine("invert ch ", i, "for band lane detection ");
    }
  }
  return images;
}

}  // namespace viraduve
