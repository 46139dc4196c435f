// Total-protein normalisation drivers: load and orient the normalisation channel, settle the
// strip width and rolling-ball radius (defaults from the capture geometry, overridable by the
// optional "tpn.cfg" of the current directory), measure, and divide the band measures.
#include <algorithm>
#include <cmath>
#include <ctime>
#include <fstream>
#include <sstream>
#include <string>

#include "common/channel_files.h"
#include "common/checked.h"
#include "common/log.h"
#include "detector/BandLaneDetectionImpl.h"
#include "pipeline/ImageProcessing.h"
#include "pipeline/tpn_config.h"
#include "viraduve/Exception.h"

namespace viraduve {

namespace {

const char kFile[] = "DaduZerovoVur\\ImageProcessing";

// The value after the first "=" that follows key in line, read as formatted input (0 when
// nothing numeric follows). False when the line does not set the key.
template <typename T>
bool keyValue(const std::string& line, const std::string& key, T& value) {
  const std::size_t keyPos = line.find(key);
  if (keyPos == std::string::npos) return false;
  const std::size_t eq = line.find('=', keyPos + key.size());
  if (eq == std::string::npos) return false;
  std::istringstream in(line.substr(eq + 1));
  value = T();
  in >> value;
  return true;
}

std::string joined(const std::vector<double>& values) {
  std::ostringstream os;
  for (std::size_t i = 0; i < values.size(); ++i) os << (i ? " " : "") << values[i];
  return os.str();
}

}  // namespace

void applyTpnConfigLine(const std::string& line, double shortSideMm, double resolution,
                        TpnSettings& settings) {
  int width = 0;
  if (keyValue(line, "band lane width (in %)", width) && width >= 25 && width <= 100) {
    settings.widthRatio = width / 100.0;
    logLine("----- band lane width is ", width);
  }
  double size = 0.0;
  if (keyValue(line, "rolling ball size (in mm)", size) && size > 0 && size < shortSideMm) {
    settings.rbRadius = static_cast<int>(size * resolution + 0.5);
    logLine("----- rolling ball size (in mm) ", size);
  }
}

void readTpnConfig(std::istream& in, double shortSideMm, double resolution,
                   TpnSettings& settings) {
  std::string line;
  while (std::getline(in, line)) {
    // A file written on another platform may end its lines with CR LF.
    if (!line.empty() && line.back() == '\r') line.pop_back();
    logLine("----- Received line : ", line);
    applyTpnConfigLine(line, shortSideMm, resolution, settings);
  }
}

TpnSettings defaultTpnSettings(int rows, int cols, double opticalZoom, uint32_t binning,
                               double& resolution, double& shortSideMm) {
  // Without a binning the pixel size is unknown (the resolution would be infinite and the
  // radius an undefined conversion); refuse rather than guess.
  if (binning == 0) {
    throw Exception(-4, "ERROR! binning must be greater than 0",
                    "ImageProcessing::computeAllNormFactor", kFile, 0);
  }
  const int shortSide = std::min(rows, cols);
  resolution = 2704.0 / (binning * 184.0) * opticalZoom;
  shortSideMm = shortSide / resolution;
  TpnSettings settings;
  settings.rbRadius = std::min(shortSide / 4, static_cast<int>(resolution * 4.0 + 0.5));
  settings.widthRatio = 0.9;
  return settings;
}

namespace ImageProcessing {

void computeAllNormFactor(const std::string& imageDir, ImageMode imgMode,
                          std::vector<ImageParam> imageParams, int normalizationChannelIndex,
                          const std::vector<VerticalRange>& verticalRanges,
                          LanesPerFrame& allBandlanes,
                          std::vector<std::vector<double>>& allNormFactor,
                          std::vector<std::vector<double>>& allLaneVolume,
                          std::vector<std::vector<double>>& allLaneBackgroundVolume,
                          std::vector<std::vector<double>>& allLaneAdjustedVolume,
                          double digitalZoom, double opticalZoom, uint32_t binning) {
  const std::clock_t start = std::clock();
  logLine("In computeAllNormFactor().");
  logLine("Input: ");
  logLine("imageDir: ", imageDir);
  logLine("imgMode: ", imageModeName(imgMode));
  for (const VerticalRange& range : verticalRanges) {
    logLine("Vertical Range: y1 = ", range[0], ", y2 = ", range[1]);
  }
  logLine("normalizationChannelIndex: ", normalizationChannelIndex);
  allNormFactor.clear();
  allLaneVolume.clear();
  allLaneBackgroundVolume.clear();
  allLaneAdjustedVolume.clear();

  const std::vector<std::string> files = listChannelFiles(imageDir);
  logLine("normalizationChannelIndex = ", normalizationChannelIndex);
  Image image(imageDir, at(files, normalizationChannelIndex));

  std::vector<int> defaultBackgrounds;
  setRawImageDefaultBackground(imgMode, imageParams, defaultBackgrounds, false);
  if (invertForAnalysis(imgMode, defaultBackgrounds, imageParams,
                        checkedIndex(normalizationChannelIndex, files.size()))) {
    invertChannelImage(image, image, 65535);
  }

  BandLaneDetectionImpl detector;

  int maxLaneWidth = 0;
  for (const std::vector<Lane2D>& lanes : allBandlanes) {
    maxLaneWidth = std::max(maxLaneWidth, lanes.empty() ? 0 : lanes.front().width);
  }
  logLine("maxLaneWidth = ", maxLaneWidth);

  double resolution = 0.0;
  double shortSideMm = 0.0;
  TpnSettings settings =
      defaultTpnSettings(image.rows(), image.cols(), opticalZoom, binning, resolution, shortSideMm);
  logLine("rbRadius = ", settings.rbRadius);

  std::ifstream config("tpn.cfg");
  if (config && config.peek() != std::ifstream::traits_type::eof()) {
    logLine("Zoom value is ", digitalZoom, ", optical zoom is ", opticalZoom, ", binning is ",
            binning, ", resolution is ", resolution, " pixels/mm");
    readTpnConfig(config, shortSideMm, resolution, settings);
  }
  config.close();

  detector.computeAllNormFactor(image, verticalRanges, allBandlanes, settings.rbRadius,
                                settings.widthRatio, allNormFactor, allLaneVolume,
                                allLaneBackgroundVolume, allLaneAdjustedVolume);

  logLine("allNormFactor.size() = ", allNormFactor.size());
  logLine("allLaneVolume.size() = ", allLaneVolume.size());
  logLine("allLaneBackgroundVolume.size() = ", allLaneBackgroundVolume.size());
  logLine("allLaneAdjustedVolume.size() = ", allLaneAdjustedVolume.size());
  for (std::size_t f = 0; f < allNormFactor.size(); ++f) {
    logLine("Frame :", f);
    logLine("normFactor: ", joined(allNormFactor[f]));
    logLine("volume: ", joined(at(allLaneVolume, f)));
    logLine("adjustedVolume: ", joined(at(allLaneAdjustedVolume, f)));
  }
  logLine("Out computeAllNormFactor().");
  logLine("Time taken: ", secondsSince(start));
}

void applyNormalization(LanesPerFrame& allBandlanes,
                        const std::vector<std::vector<double>>& allNormFactor) {
  const std::clock_t start = std::clock();
  logLine("In applyNormalization().");
  logLine("allBandlanes.size() = ", allBandlanes.size());
  logLine("allNormFactor.size() = ", allNormFactor.size());
  const char* function = "ImageProcessing::applyNormalization";
  if (allBandlanes.size() != allNormFactor.size()) {
    throw Exception(-7, "num of frames mismatch.", function, kFile, 0);
  }
  for (const std::vector<double>& factors : allNormFactor) {
    if (factors.empty()) {
      logLine("Warning: empty frame");
    } else if (*std::min_element(factors.begin(), factors.end()) <= 0) {
      throw Exception(-7, "norm factors should be greater than 0", function, kFile, 0);
    }
  }

  for (std::size_t f = 0; f < allBandlanes.size(); ++f) {
    logLine("Normalizing frame ", f);
    std::vector<Lane2D>& lanes = allBandlanes[f];
    if (lanes.empty()) logLine("Warning: frame ", f, " is an empty frame");
    for (std::size_t j = 0; j < lanes.size(); ++j) {
      const double factor = at(allNormFactor[f], j);
      logLine("lane_", j, ", factor = ", factor);
      if (lanes[j].bands.empty()) {
        logLine("Warning: lane ", j, " is an empty lane and skipped normalization.");
        continue;
      }
      for (Band2D& b : lanes[j].bands) {
        b.volume_norm = b.volume / factor;
        b.density_norm = b.density / factor;
        b.local_bg_volume_norm = b.local_bg_volume / factor;
        b.local_bg_density_norm = b.local_bg_density / factor;
        b.global_bg_volume_norm = b.global_bg_volume / factor;
        b.global_bg_density_norm = b.global_bg_density / factor;
        b.rolling_bg_volume_norm = b.rolling_bg_volume / factor;
        b.rolling_bg_density_norm = b.rolling_bg_density / factor;
        b.lane_bg_volume_norm = b.lane_bg_volume / factor;
        b.lane_bg_density_norm = b.lane_bg_density / factor;
      }
    }
  }
  logLine("Out applyNormalization().");
  logLine("Time taken: ", secondsSince(start));
}

}  // namespace ImageProcessing
}  // namespace viraduve
