// The records every analysis works on: working records (ImageParam, ROI, Lane2D, Band2D,
// Region2D) and the exchange records that mirror request and response JSON (Cloud*).
#pragma once

#include <cstdint>
#include <map>
#include <string>
#include <utility>
#include <vector>

#include "viraduve/export.h"

namespace viraduve {

enum ImageMode : int32_t {
  ImageMode_Chemi = 0,
  ImageMode_Fluo = 1,
  ImageMode_Vis = 2,
  ImageMode_UV = 3,
  ImageMode_Protein = 4,
  ImageMode_Universal = 5,
  ImageMOde_Other = 6,
  ImageMode_UV_WHITE = 10,
};

enum ChannelType : int32_t {
  ChType_Live = 0,
  ChType_Membrane = 1,
  ChType_Chemi = 2,
  ChType_Fluo = 3,
  ChType_NA = 4,
  ChType_Protein = 5,
  ChType_Vis = 6,
};

struct ImageParam {
  int32_t img_min = 0;
  int32_t img_max = 65535;
  float img_gamma = 1.0f;
  double img_angle = 0.0;
  bool img_invert = false;
  bool img_flip_h = false;
  bool img_flip_v = false;
  ChannelType channelType = ChType_Chemi;
  int32_t backgroundInverted = 0;
};

// Axis-parallel rectangle, inclusive corners unless the producer says otherwise.
struct ROI {
  int32_t x1 = 0;
  int32_t y1 = 0;
  int32_t x2 = 0;
  int32_t y2 = 0;
};

// Centre and radius in pixels, for circular global-background areas.
struct Circle {
  int32_t x = 0;
  int32_t y = 0;
  int32_t radius = 0;
};

struct Band2D {
  uint32_t channel = 0;
  int32_t x1 = 0;
  int32_t y1 = 0;
  int32_t x2 = 0;
  int32_t y2 = 0;
  bool mw_b = false;
  double band_s_x = 0.0;
  double band_s_y = 0.0;
  double area = 0.0;
  double volume = 0.0;
  double density = 0.0;
  double median_intensity = 0.0;
  double rf = 0.0;
  double purity_band = 0.0;
  double purity_lane = 0.0;
  double local_bg_volume = 0.0;
  double local_bg_density = 0.0;
  double global_bg_volume = 0.0;
  double global_bg_density = 0.0;
  double rolling_bg_volume = 0.0;
  double rolling_bg_density = 0.0;
  double lane_bg_volume = 0.0;
  double lane_bg_density = 0.0;
  double wm = 0.0;
  double r_quantity = 0.0;
  double a_quantity = 0.0;
  double volume_norm = 0.0;
  double density_norm = 0.0;
  double local_bg_volume_norm = 0.0;
  double local_bg_density_norm = 0.0;
  double global_bg_volume_norm = 0.0;
  double global_bg_density_norm = 0.0;
  double rolling_bg_volume_norm = 0.0;
  double rolling_bg_density_norm = 0.0;
  double lane_bg_volume_norm = 0.0;
  double lane_bg_density_norm = 0.0;
};

struct Lane2D {
  int32_t x1 = 0;
  int32_t y1 = 0;
  int32_t x2 = 0;
  int32_t y2 = 0;
  int32_t width = 0;
  int32_t num_bands = 0;
  double lane_s = 0.0;
  bool mw = false;
  bool update_flag = false;
  std::vector<Band2D> bands;
};

struct Region2D {
  uint32_t channel = 0;
  bool circle_b = false;
  uint32_t x1 = 0;
  uint32_t y1 = 0;
  uint32_t x2 = 0;
  uint32_t y2 = 0;
  uint32_t x = 0;
  uint32_t y = 0;
  uint32_t circle_radius = 0;
  double volume = 0.0;
  double area = 0.0;
  double density = 0.0;
  double median_intensity = 0.0;
  double purity = 0.0;
  double local_bg_volume = 0.0;
  double local_bg_density = 0.0;
  double global_bg_volume = 0.0;
  double global_bg_density = 0.0;
  double rolling_bg_volume = 0.0;
  double rolling_bg_density = 0.0;
  double r_quantity = 0.0;
  double a_quantity = 0.0;
};

struct CloudImageParam {
  int32_t img_min = 0;
  int32_t img_max = 65535;
  double img_gamma = 1.0;
  int32_t brightness = 0;
  double img_angle = 0.0;
  bool img_invert = false;
  bool img_flip_h = false;
  bool img_flip_v = false;
  int32_t r = 0;
  int32_t g = 0;
  int32_t b = 0;
  double digitalZoom = 1.0;
  double opticalZoom = 1.0;
  int32_t binning = 3;
  std::string backgroundDetection;
  bool auto_contrast = false;
  ChannelType channelAppMode = ChType_Chemi;
  int32_t backgroundInverted = 0;
  bool saturation = false;
};

struct SensitivityEntry {
  uint32_t channel = 0;
  uint32_t value = 0;
};

struct CloudFrame {
  uint32_t x1 = 0;
  uint32_t y1 = 0;
  uint32_t x2 = 0;
  uint32_t y2 = 0;
  uint32_t x3 = 0;
  uint32_t y3 = 0;
  uint32_t x4 = 0;
  uint32_t y4 = 0;
  std::vector<SensitivityEntry> sensitivity;
  std::string uid;
  std::string annotateText;
};

struct CloudBand {
  uint32_t channel = 0;
  uint32_t x1 = 0;
  uint32_t y1 = 0;
  uint32_t x2 = 0;
  uint32_t y2 = 0;
  bool mw_b = false;
  double band_s_x = 0.0;
  double band_s_x_raw = 0.0;
  double band_s_y = 0.0;
  double area = 0.0;
  double volume = 0.0;
  double density = 0.0;
  double median_intensity = 0.0;
  double rf = 0.0;
  double purity_band = 0.0;
  double purity_lane = 0.0;
  double local_bg_volume = 0.0;
  double local_bg_density = 0.0;
  double global_bg_volume = 0.0;
  double global_bg_density = 0.0;
  double rolling_bg_volume = 0.0;
  double rolling_bg_density = 0.0;
  double lane_bg_volume = 0.0;
  double lane_bg_density = 0.0;
  double wm = 0.0;
  double r_quantity = 0.0;
  double a_quantity = 0.0;
  double volume_norm = 0.0;
  double density_norm = 0.0;
  double local_bg_volume_norm = 0.0;
  double local_bg_density_norm = 0.0;
  double global_bg_volume_norm = 0.0;
  double global_bg_density_norm = 0.0;
  double rolling_bg_volume_norm = 0.0;
  double rolling_bg_density_norm = 0.0;
  double lane_bg_volume_norm = 0.0;
  double lane_bg_density_norm = 0.0;
  std::string uid;
  std::string annotateText;
};

struct CloudLane {
  uint32_t x1 = 0;
  uint32_t y1 = 0;
  uint32_t x2 = 0;
  uint32_t y2 = 0;
  uint32_t width = 0;
  uint32_t num_bands = 0;
  double lane_s = 0.0;
  bool mw = false;
  bool update_flag = false;
  std::string uid;
  std::string annotateText;
  double norm_factor = 0.0;
  double lane_volume = 0.0;
  double lane_background_volume = 0.0;
  double lane_adjusted_volume = 0.0;
  std::vector<CloudBand> bands;
};

struct CloudRegion {
  uint32_t channel = 0;
  bool circle_b = false;
  uint32_t x1 = 0;
  uint32_t y1 = 0;
  uint32_t x2 = 0;
  uint32_t y2 = 0;
  uint32_t x = 0;
  uint32_t y = 0;
  uint32_t circle_radius = 0;
  double volume = 0.0;
  double area = 0.0;
  double density = 0.0;
  double median_intensity = 0.0;
  double purity = 0.0;
  double local_bg_volume = 0.0;
  double local_bg_density = 0.0;
  double global_bg_volume = 0.0;
  double global_bg_density = 0.0;
  double rolling_bg_volume = 0.0;
  double rolling_bg_density = 0.0;
  double r_quantity = 0.0;
  double a_quantity = 0.0;
  std::string uid;
  std::string name;
  std::string refName;
  bool backgroundCorrected = false;
  std::string bgColor;
};

struct CloudFrameLanes {
  CloudFrame roi;
  std::vector<CloudLane> lanes;
};

// Marker weights of one marker frame: weight -> (frame x, band y) pairs in input order.
using MarkerWeightMap = std::map<float, std::vector<std::pair<int32_t, int32_t>>>;

// Text classifiers: ASCII lower-casing, then the first substring hit in a fixed order.
VIRADUVE_EXPORT ImageMode toImageMode(const std::string& text);
VIRADUVE_EXPORT ChannelType toChannelType(const std::string& text);
VIRADUVE_EXPORT std::string imageModeName(int mode);
VIRADUVE_EXPORT std::string channelTypeName(int type);
// True when both texts are non-empty, of equal length and equal after ASCII lower-casing.
VIRADUVE_EXPORT bool equalsNoCase(const std::string& a, const std::string& b);

// Console printers (standard output, one flushed line per line).
VIRADUVE_EXPORT void printImageParam(const ImageParam& p);
VIRADUVE_EXPORT void printLane2D(const Lane2D& lane);
VIRADUVE_EXPORT void printBand2D(const Band2D& band);
VIRADUVE_EXPORT void printROI(const ROI& roi);

}  // namespace viraduve
