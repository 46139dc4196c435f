// Export::runImageExport and the pixel-format, print-size and font arithmetic it uses.
#include "export/export_driver.h"

#include <stdlib.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cmath>
#include <cstdio>
#include <ctime>
#include <filesystem>
#include <fstream>
#include <initializer_list>
#include <stdexcept>
#include <system_error>

#include <opencv2/imgcodecs.hpp>
#include <opencv2/imgproc.hpp>

#include "common/channel_files.h"
#include "common/checked.h"
#include "common/log.h"
#include "export/channel_rendering.h"
#include "viraduve/Exception.h"
#include "viraduve/Image.h"

namespace viraduve {
namespace Export {

namespace {

int truncInt(double v) { return static_cast<int>(std::trunc(v)); }

std::clock_t ticksSince(std::clock_t start) { return std::clock() - start; }

cv::Mat inverted(const cv::Mat& channel16) {
  cv::Mat out;
  cv::subtract(cv::Scalar::all(65535), channel16, out);
  return out;
}

// Step by step display rendering of one listed channel, in place. Pictures travel as
// matrices: the TIFF coding of the channel images between steps is lossless, so leaving it out
// changes nothing but the time.
void renderChannel(cv::Mat& picture, CloudImageParam& p, ImageMode mode, int channel,
                   int channelStepFlag, float angle) {
  const int background = backgroundFlag(p);
  cv::Mat saturated;
  if (p.saturation || p.auto_contrast) {
    const cv::Mat copy = p.img_invert ? inverted(picture) : picture;
    if (p.saturation) saturated = saturationMask(copy, p, mode, channel);
    if (p.auto_contrast) autoContrastWindow(copy, p, mode, channel);
  }
  if (p.img_invert) picture = inverted(picture);
  picture = displayMapping(picture, p);
  const bool stepWanted = (mode == ImageMode_Fluo && channel != 0) ||
                          (mode == ImageMode_Universal && p.channelAppMode == ChType_Fluo);
  if (channelStepFlag == 1 && stepWanted) {
    // The step works on bright signal over a dark background.
    const cv::Mat m = channelStep(p.img_invert ? inverted(picture) : picture, p, mode, channel);
    picture = p.img_invert ? inverted(m) : m;
  }
  logLine("is black bg = ", background);
  if (!keepsGreyRendering(p, mode, background)) {
    cv::Mat grey;
    imgConvertTo(picture, grey, 8, 3);
    imgConvertTo(tintChannel(grey, p.r, p.g, p.b, background), picture, 16, 3);
    logLine("invert = ", p.img_invert);
  }
  if (p.saturation) picture = markSaturation(picture, saturated, p, mode, channel);
  // The channel image operations: mirror left-right, then top-bottom; rotate with the
  // background as fill. Both leave the picture as it is when there is nothing to do.
  if (p.img_flip_h) cv::flip(picture, picture, 1);
  if (p.img_flip_v) cv::flip(picture, picture, 0);
  if (std::fabs(angle) >= 0.001f) {
    Image turned;
    turned.setMat(picture);
    rotateChannelImage(turned, turned, angle, background);
    picture = turned.mat();
  }
}

cv::Mat scaleImageBasedOnOffset(const cv::Mat& picture, const Offset& offset) {
  cv::Mat narrow;
  imgConvertTo(picture, narrow, 8, 3);
  cv::copyMakeBorder(narrow, narrow, offset.top, offset.bottom, offset.left, offset.right,
                     cv::BORDER_CONSTANT, cv::Scalar(255, 255, 255));
  cv::Mat wide;
  imgConvertTo(narrow, wide, 16, 3);
  return wide;
}

// Coordinates far outside any picture are held at +-1e9, where drawing clips them, so that
// nothing overflows an int.
int clampedTrunc(double v) { return truncInt(std::max(-1e9, std::min(1e9, v))); }

struct Mover {
  Offset offset;
  ScalePair scale;
  int x(double v) const { return clampedTrunc((v + offset.left) * scale.x); }
  int y(double v) const { return clampedTrunc((v + offset.top) * scale.y); }
  void moveX(uint32_t& v) const { v = static_cast<uint32_t>(x(static_cast<double>(v))); }
  void moveY(uint32_t& v) const { v = static_cast<uint32_t>(y(static_cast<double>(v))); }
  void moveBox(LaneVolumeBox& b) const {
    moveX(b.x1);
    moveX(b.x2);
    moveY(b.y1);
    moveY(b.y2);
  }
  void moveLane(TpnExportLane& l) const {
    moveBox(l.laneVolTop);
    moveBox(l.laneVolBottom);
  }
};

void scaleObjects(const Mover& m, std::vector<CloudFrame>& frames,
                  std::vector<std::vector<CloudLane>>& lanesPerFrame,
                  std::vector<CloudRegion>& regions, std::vector<MarkerWeightMap>& markers,
                  std::vector<TpnExportFrame>& normalisation) {
  for (CloudFrame& f : frames) {
    for (uint32_t* v : {&f.x1, &f.x2, &f.x3, &f.x4}) m.moveX(*v);
    for (uint32_t* v : {&f.y1, &f.y2, &f.y3, &f.y4}) m.moveY(*v);
  }
  for (std::vector<CloudLane>& lanes : lanesPerFrame) {
    for (CloudLane& l : lanes) {
      m.moveX(l.x1);
      m.moveX(l.x2);
      m.moveY(l.y1);
      m.moveY(l.y2);
      l.width = static_cast<uint32_t>(truncInt(l.width * m.scale.x));
      for (CloudBand& b : l.bands) {
        m.moveX(b.x1);
        m.moveX(b.x2);
        m.moveY(b.y1);
        m.moveY(b.y2);
      }
    }
  }
  for (CloudRegion& r : regions) {
    for (uint32_t* v : {&r.x1, &r.x2, &r.x}) m.moveX(*v);
    for (uint32_t* v : {&r.y1, &r.y2, &r.y}) m.moveY(*v);
    // A radius is a length: scaled, not moved.
    r.circle_radius = static_cast<uint32_t>(truncInt(r.circle_radius * m.scale.x));
  }
  for (MarkerWeightMap& map : markers) {
    for (auto& entry : map) {
      for (auto& pair : entry.second) pair = {m.x(pair.first), m.y(pair.second)};
    }
  }
  for (TpnExportFrame& f : normalisation) {
    m.moveLane(f.referanceLane);
    for (TpnExportLane& l : f.normalizeLanes) m.moveLane(l);
    for (TpnExportLane& l : f.excludedLanes) m.moveLane(l);
  }
}

void scaleAnnotations(const Mover& m, std::vector<ChannelAnnotations>& annotations) {
  for (ChannelAnnotations& entry : annotations) {
    for (Annotation& a : entry.annotations) {
      a.x1 = m.x(a.x1);
      a.x2 = m.x(a.x2);
      a.y1 = m.y(a.y1);
      a.y2 = m.y(a.y2);
    }
  }
}

// The process's file-creation mask, read without changing it (umask() can only be read by
// setting it, which would race with other threads creating files).
mode_t processUmask() {
  std::ifstream status("/proc/self/status");
  std::string line;
  while (std::getline(status, line)) {
    if (line.rfind("Umask:", 0) == 0)
      return static_cast<mode_t>(std::stoul(line.substr(6), nullptr, 8));
  }
  return 022;
}

// Writes through a temporary file in the same folder and a rename, so that a failed export
// never leaves a half-written picture behind.
void writePicture(const std::string& folder, const std::string& name,
                  const std::string& extension, const cv::Mat& picture) {
  const std::string path = folder + name + "." + extension;
  const std::string suffix = "." + extension;
  std::string temp = folder + "." + name + ".XXXXXX" + suffix;
  const int fd = mkstemps(temp.data(), static_cast<int>(suffix.size()));
  if (fd < 0) throw std::runtime_error("ERROR! Export file could not be written: " + path);
  close(fd);
  // mkstemps creates the file for its owner only; an exported picture gets the mode a newly
  // created file would (0666 less the umask).
  chmod(temp.c_str(), 0666 & ~processUmask());
  bool written = false;
  try {
    written = cv::imwrite(temp, picture);
  } catch (...) {
    std::remove(temp.c_str());
    throw;
  }
  std::error_code ec;
  if (written) std::filesystem::rename(temp, path, ec);
  if (!written || ec) {
    std::remove(temp.c_str());
    throw std::runtime_error("ERROR! Export file could not be written: " + path);
  }
}

}  // namespace

void imgConvertTo(const cv::Mat& src, cv::Mat& dst, int depth, int channels) {
  const std::string name = "CV_" + Image::typeText(src.type());
  int srcDepth = 0;
  if (name.find("16") != std::string::npos) {
    srcDepth = 16;
  } else if (name.find('8') != std::string::npos) {
    srcDepth = 8;
  }
  int srcChannels = 0;
  if (name.find("C3") != std::string::npos) {
    srcChannels = 3;
  } else if (name.find("C1") != std::string::npos) {
    srcChannels = 1;
  }
  if (srcDepth == 0) {
    throw Exception(-3, "ERROR! Image format not supported for export", "Export::imgConvertTo",
                    "DaduZerovoVur\\ImageExport", 97);
  }
  if (srcChannels == 0) {
    throw Exception(-3, "ERROR! Image format not supported for export", "Export::imgConvertTo",
                    "DaduZerovoVur\\ImageExport", 107);
  }
  // Each conversion writes a new matrix, so the source is copied only when none applies.
  cv::Mat out = src;
  if (depth != srcDepth) {
    if (depth == 8) {
      src.convertTo(out, CV_8U, 0.00392156862745098);
    } else if (depth == 16) {
      src.convertTo(out, CV_16U, 255);
    }
  }
  if (channels != srcChannels) {
    cv::Mat converted;
    if (channels == 1) {
      cv::cvtColor(out, converted, cv::COLOR_BGR2GRAY);
      out = converted;
    } else if (channels == 3) {
      cv::cvtColor(out, converted, cv::COLOR_GRAY2BGR);
      out = converted;
    }
  }
  dst = out.data == src.data ? src.clone() : out;
  if ((depth != 8 && depth != 16) || (channels != 1 && channels != 3)) {
    logLine("Warn: Image type " + name + " is not supported!!");
  }
}

TargetSize targetSize(const ExportAttributes& attributes, int rows, int cols) {
  TargetSize t;
  t.height = static_cast<double>(attributes.dpi) * static_cast<double>(attributes.height) / 2.54;
  t.width = static_cast<double>(attributes.dpi) * static_cast<double>(attributes.width) / 2.54;
  if (t.height >= rows * t.width / cols) {
    t.height = rows * t.width / cols;
  } else if (t.width >= cols * t.height / rows) {
    t.width = cols * t.height / rows;
  }
  return t;
}

FontParameters fontParameters(TargetSize target) {
  const double s = std::sqrt(target.width * target.height);
  FontParameters f;
  f.fontScale = std::max(0.2, 0.43 * s / 1000);
  f.fontThickness = truncInt(std::max(1.0, 1 * s / 1000));
  logLine("scaled imgArea = ", s);
  logLine("font scale = ", f.fontScale);
  logLine("font thickness = ", f.fontThickness);
  return f;
}

int shapeLineThickness(TargetSize target) {
  const int thickness = truncInt(std::max(1.0, std::sqrt(target.width * target.height) / 700));
  logLine("shape annotation thickness = ", thickness);
  return thickness;
}

std::string fileExtension(uint32_t format) {
  if (format == 1) return "png";
  if (format == 2) return "jpg";
  return "tif";
}

// The host's platform name chose "/" or "\" (or nothing) as separator on its own system;
// here every path is joined with "/", which is the only separator that works.
std::string outputFolder(const std::string& imageDir) { return imageDir + "/output/"; }

void runImageExport(std::string& result, const std::string& imageDir,
                    const std::string& outputDir,
                    std::vector<std::vector<CloudLane>> lanesPerFrame,
                    std::vector<CloudFrame> frames, std::vector<CloudImageParam> imageParams,
                    const ExportAttributes& attributes, ImageMode mode,
                    std::vector<CloudRegion> regions, int channelStepFlag,
                    const std::vector<uint32_t>& overlayList,
                    std::vector<ChannelAnnotations> annotations,
                    std::vector<TpnExportFrame> normalisation,
                    std::vector<MarkerWeightMap> markers,
                    std::vector<std::string>& pictureNames) {
  const std::clock_t start = std::clock();
  const std::string extension = fileExtension(attributes.format);

  // Channels are loaded by their names ch0.tif, ch1.tif, ... up to the number found.
  const std::size_t channelCount = listChannelFiles(imageDir).size();
  std::vector<cv::Mat> images;
  for (std::size_t i = 0; i < channelCount; ++i) {
    images.push_back(Image(imageDir, "ch" + std::to_string(i) + ".tif").mat());
    pictureNames.push_back("ch" + std::to_string(i));
  }
  if (images.size() != imageParams.size()) {
    throw Exception(-4, "ERROR! Image File Number is Not Equal to Image Parameter Number",
                    "Export::runImageExport", "DaduZerovoVur\\ImageExport", 1471);
  }

  for (uint32_t c : overlayList) {
    CloudImageParam& p = at(imageParams, c);
    renderChannel(at(images, c), p, mode, static_cast<int>(c), channelStepFlag,
                  static_cast<float>(at(imageParams, 0).img_angle));
  }

  // Merging into one picture, or the pictures of the listed channels.
  int mergedIndex = -1;
  if (attributes.channelSelection == 1 || attributes.channelSelection == 3) {
    if (mode == ImageMode_Chemi || mode == ImageMode_Fluo || mode == ImageMode_Universal) {
      const uint32_t firstChannel = at(overlayList, 0);
      cv::Mat merged;
      imgConvertTo(at(images, firstChannel), merged, 8, 3);
      const bool multiply = at(imageParams, firstChannel).backgroundDetection == "white";
      for (std::size_t k = 1; k < overlayList.size(); ++k) {
        cv::Mat next;
        imgConvertTo(at(images, overlayList[k]), next, 8, 3);
        blendChannel(merged, next, multiply);
      }
      cv::Mat merged16;
      imgConvertTo(merged, merged16, 16, 3);
      images.push_back(merged16);
      pictureNames.push_back("overlay");
      mergedIndex = static_cast<int>(images.size()) - 1;
    } else if (!images.empty()) {
      images.push_back(images[0].clone());
      pictureNames.push_back("overlay");
      mergedIndex = static_cast<int>(images.size()) - 1;
    }
  }
  std::vector<std::size_t> pictures;
  std::vector<int> pictureChannels;
  if (mergedIndex >= 0) {
    pictures.push_back(static_cast<std::size_t>(mergedIndex));
    pictureChannels.push_back(-1);
  } else {
    for (uint32_t c : overlayList) {
      pictures.push_back(c);
      pictureChannels.push_back(static_cast<int>(c));
    }
  }

  // Margins for labels that reach outside the picture.
  std::clock_t stage = std::clock();
  Offset offset;
  if (attributes.exportLayers || attributes.exportMarkers) {
    const cv::Size unscaled = at(images, 0).size();
    const TargetSize provisional = targetSize(attributes, unscaled.height, unscaled.width);
    const ScalePair scale{provisional.width / unscaled.width, provisional.height / unscaled.height};
    const FontParameters font = fontParameters(provisional);
    if (attributes.exportLayers) {
      calculateFrameNameOffset(offset, frames, scale, unscaled, font.fontScale, font.fontThickness);
    }
    if (attributes.exportAnnotation) {
      calculateAnnotationOffset(offset, annotations, pictureChannels, unscaled);
    }
    if (attributes.exportMarkers) {
      calculateMarkerOffset(offset, markers, scale, unscaled, font.fontScale, font.fontThickness);
    }
  } else if (attributes.exportAnnotation) {
    calculateAnnotationOffset(offset, annotations, pictureChannels, at(images, 0).size());
  }
  const cv::Mat& firstListed = at(images, at(pictures, 0));
  const int colsBefore = firstListed.cols;
  const int rowsBefore = firstListed.rows;
  const bool hasMargin = offset.left != 0 || offset.right != 0 || offset.top != 0 || offset.bottom != 0;
  // Marker labels need their margin too: without it the objects would be moved by a margin
  // the picture does not have.
  if (attributes.exportLayers || attributes.exportAnnotation || (attributes.exportMarkers && hasMargin)) {
    logLine("Time taken for calculateOffset = ", ticksSince(stage));
    stage = std::clock();
    for (std::size_t index : pictures) images[index] = scaleImageBasedOnOffset(images[index], offset);
    logLine("Time taken for scaleImageBasedOnOffset = ", ticksSince(stage));
  }

  // Scaling to the print size.
  stage = std::clock();
  const TargetSize target = targetSize(attributes, firstListed.rows, firstListed.cols);
  // A print of more than 2^28 pixels (16384 x 16384) is no real request, and its pictures
  // would exhaust the memory of the host process.
  if (!(target.width * target.height <= 268435456.0)) {
    throw std::length_error("ERROR! Requested export size is too large");
  }
  const cv::Size outputSize(truncInt(target.width), truncInt(target.height));
  for (std::size_t index : pictures) {
    cv::Mat resized;
    cv::resize(images[index], resized, outputSize, 0, 0, cv::INTER_LINEAR);
    images[index] = resized;
  }
  logLine("Time taken for scaleImageForDPI = ", ticksSince(stage));
  const ScalePair scale{target.width / (offset.left + colsBefore + offset.right),
                        target.height / (offset.top + rowsBefore + offset.bottom)};
  const FontParameters font = fontParameters(target);
  const int shapeThickness = shapeLineThickness(target);

  const Mover mover{offset, scale};
  scaleObjects(mover, frames, lanesPerFrame, regions, markers, normalisation);
  logLine("Analysis object scaled");

  // Overlays are drawn on the 8-bit form the files are written in.
  std::vector<cv::Mat> drawn(pictures.size());
  for (std::size_t i = 0; i < pictures.size(); ++i) {
    imgConvertTo(images[pictures[i]], drawn[i], 8, 3);
  }
  if (attributes.exportLayers) {
    stage = std::clock();
    for (std::size_t i = 0; i < pictures.size(); ++i) {
      if (!frames.empty()) {
        drawLaneBands(drawn[i], frames, lanesPerFrame, normalisation, scale, font.fontScale,
                      font.fontThickness, shapeThickness);
      }
      if (!regions.empty()) {
        drawRegions(drawn[i], regions, pictureChannels[i], font.fontScale, font.fontThickness);
      }
    }
    logLine("Time taken for export_attributes.export_layers true = ", ticksSince(stage));
  }
  if (attributes.exportMarkers) {
    const int labelSize = markerLabelSize(scale.x);
    for (cv::Mat& picture : drawn) {
      drawMarkers(picture, markers, scale, labelSize, font.fontScale, font.fontThickness,
                  shapeThickness);
    }
  }
  if (attributes.exportAnnotation) {
    stage = std::clock();
    scaleAnnotations(mover, annotations);
    for (std::size_t i = 0; i < pictures.size(); ++i) {
      drawAnnotations(drawn[i], annotations, pictureChannels[i], scale.y, shapeThickness);
    }
    logLine("Time taken for export_attributes.exportAnnotation true = ", ticksSince(stage));
  }

  const std::string folder = outputFolder(outputDir);
  std::error_code ec;
  std::filesystem::create_directories(folder, ec);
  for (std::size_t i = 0; i < pictures.size(); ++i) {
    writePicture(folder, pictureNames[pictures[i]], extension, drawn[i]);
  }
  logLine("Time taken for image export = ", ticksSince(start));
  result.clear();
}

}  // namespace Export
}  // namespace viraduve
