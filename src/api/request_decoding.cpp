// Request JSON into exchange and working records. Every key goes through JsonCpp's own
// conversions on const values: a missing key reads as null (0, false, ""), a refused
// conversion or a key lookup in a non-object throws the JSON library's error.
#include "api/request_decoding.h"

#include <cmath>
#include <cstdint>
#include <utility>

#include "common/log.h"
#include "model/conversion.h"

namespace viraduve {
namespace api {

namespace {

using Json::ArrayIndex;

// The reciprocal gamma of the inverted display, rounded half away from zero to two decimals.
// Worked in double, the width the record stores: 0.8 (read as float) gives 1.25, 3.0 gives 0.33.
double invertedGamma(double gamma) { return std::round(1.0 / gamma * 100.0) / 100.0; }

CloudImageParam decodeImageParam(const Json::Value& e) {
  CloudImageParam p;
  p.img_angle = e["img_angle"].asDouble();
  p.img_gamma = static_cast<double>(e["img_gamma"].asFloat());
  p.brightness = e["brightness"].asInt();
  p.img_invert = e["img_invert"].asBool();
  p.img_max = e["img_max"].asInt();
  p.img_min = e["img_min"].asInt();
  p.r = e["r"].asInt();
  p.g = e["g"].asInt();
  p.b = e["b"].asInt();
  p.img_flip_h = e["img_flip_h"].asBool();
  p.img_flip_v = e["img_flip_v"].asBool();
  p.saturation = e["saturation"].asBool();
  p.backgroundInverted = e["backgroundInverted"].asBool() ? 1 : 0;
  p.auto_contrast = e["auto_contrast"].asBool();
  p.channelAppMode = toChannelType(e["channelAppMode"].asString());
  p.digitalZoom = e["digitalZoom"].asDouble();
  p.opticalZoom = e["opticalZoom"].asDouble();
  p.binning = e["binning"].asInt();
  p.backgroundDetection = e["backgroundDetection"].asString();
  if (p.img_invert) {
    const int32_t oldMin = p.img_min;
    const int32_t oldMax = p.img_max;
    p.img_max = 65535 - oldMin;
    p.img_min = 65535 - oldMax;
    p.img_gamma = invertedGamma(p.img_gamma);
  }
  return p;
}

// Identifiers are kept only when the request names one.
void keepIfNotEmpty(const Json::Value& v, std::string& target) {
  std::string text = v.asString();
  if (!text.empty()) target = std::move(text);
}

CloudFrame decodeFrameFields(const Json::Value& frame) {
  CloudFrame f;
  f.x1 = frame["x1"].asUInt();
  f.y1 = frame["y1"].asUInt();
  f.x2 = frame["x2"].asUInt();
  f.y2 = frame["y2"].asUInt();
  f.x3 = frame["x3"].asUInt();
  f.y3 = frame["y3"].asUInt();
  f.x4 = frame["x4"].asUInt();
  f.y4 = frame["y4"].asUInt();
  const Json::Value& sensitivity = frame["sensitivity"];
  for (ArrayIndex i = 0; i < sensitivity.size(); ++i) {
    const Json::Value& s = sensitivity[i];
    SensitivityEntry entry;
    entry.channel = s["channel"].asUInt();
    entry.value = s["value"].asUInt();
    f.sensitivity.push_back(entry);
  }
  keepIfNotEmpty(frame["uid"], f.uid);
  return f;
}

CloudBand decodeBand(const Json::Value& b) {
  CloudBand band;
  band.x1 = b["x1"].asUInt();
  band.y1 = b["y1"].asUInt();
  band.x2 = b["x2"].asUInt();
  band.y2 = b["y2"].asUInt();
  band.channel = b["channel"].asUInt();
  band.band_s_x = b["band_s_x"].asDouble();
  band.band_s_y = b["band_s_y"].asDouble();
  band.band_s_x_raw = b["band_s_x_raw"].asDouble();
  band.area = b["area"].asDouble();
  band.volume = b["volume"].asDouble();
  band.density = b["density"].asDouble();
  band.median_intensity = b["median_intensity"].asDouble();
  band.rf = b["rf"].asDouble();
  band.purity_band = b["purity_band"].asDouble();
  band.purity_lane = b["purity_lane"].asDouble();
  band.local_bg_volume = b["local_bg_volume"].asDouble();
  band.local_bg_density = b["local_bg_density"].asDouble();
  band.global_bg_volume = b["global_bg_volume"].asDouble();
  band.global_bg_density = b["global_bg_density"].asDouble();
  band.rolling_bg_volume = b["rolling_bg_volume"].asDouble();
  band.rolling_bg_density = b["rolling_bg_density"].asDouble();
  keepIfNotEmpty(b["uid"], band.uid);
  return band;
}

CloudLane decodeLane(const Json::Value& entry) {
  CloudLane lane;
  const Json::Value& l = entry["lane"];
  lane.x1 = l["x1"].asUInt();
  lane.y1 = l["y1"].asUInt();
  lane.x2 = l["x2"].asUInt();
  lane.y2 = l["y2"].asUInt();
  lane.width = l["width"].asUInt();
  lane.update_flag = l["update_flag"].asBool();
  lane.annotateText = l["annotateText"].asString();
  lane.norm_factor = l["norm_factor"].asDouble();
  lane.lane_volume = l["lane_volume"].asDouble();
  lane.lane_background_volume = l["lane_background_volume"].asDouble();
  lane.lane_adjusted_volume = l["lane_adjusted_volume"].asDouble();
  keepIfNotEmpty(l["uid"], lane.uid);
  const Json::Value& bands = entry["bands"];
  logLine("Band size : ", bands.size());
  for (ArrayIndex k = 0; k < bands.size(); ++k) lane.bands.push_back(decodeBand(bands[k]));
  return lane;
}

}  // namespace

void decodeImageParas(const Json::Value& paras, std::vector<CloudImageParam>& cloudParams,
                      std::vector<ImageParam>& params) {
  const std::size_t first = cloudParams.size();
  for (ArrayIndex i = 0; i < paras.size(); ++i) cloudParams.push_back(decodeImageParam(paras[i]));
  for (std::size_t i = first; i < cloudParams.size(); ++i) {
    params.push_back(toImageParam(cloudParams[i]));
  }
}

void decodeFrame(const Json::Value& frame, std::vector<ROI>& rois,
                 std::vector<std::vector<Lane2D>>& lanes2d, std::vector<CloudFrame>& cloudFrames,
                 std::vector<std::vector<CloudLane>>& cloudLanes) {
  CloudFrame cloudFrame = decodeFrameFields(frame);
  const ROI roi = toROI(cloudFrame);
  const Json::Value& roiList = frame["roiList"];
  logLine("laneSize : ", roiList.size());
  std::vector<CloudLane> frameLanes;
  std::vector<Lane2D> frameLanes2d;
  for (ArrayIndex j = 0; j < roiList.size(); ++j) {
    frameLanes.push_back(decodeLane(roiList[j]));
    frameLanes2d.push_back(toLane2D(frameLanes.back()));
  }
  rois.push_back(roi);
  lanes2d.push_back(std::move(frameLanes2d));
  cloudFrames.push_back(std::move(cloudFrame));
  cloudLanes.push_back(std::move(frameLanes));
}

void decodeFrameOnly(const Json::Value& frame, std::vector<ROI>& rois,
                     std::vector<CloudFrame>& cloudFrames) {
  CloudFrame cloudFrame = decodeFrameFields(frame);
  rois.push_back(toROI(cloudFrame));
  cloudFrames.push_back(std::move(cloudFrame));
}

void decodeFrameList(const Json::Value& array, std::vector<ROI>& rois,
                     std::vector<std::vector<Lane2D>>& lanes2d,
                     std::vector<CloudFrame>& cloudFrames,
                     std::vector<std::vector<CloudLane>>& cloudLanes) {
  logLine("analysisFrame List Size: ", array.size());
  for (ArrayIndex i = 0; i < array.size(); ++i) {
    decodeFrame(array[i]["analysisFrame"], rois, lanes2d, cloudFrames, cloudLanes);
  }
}

void decodeRegions(const Json::Value& regionArray, std::vector<Region2D>& regions2d,
                   std::vector<CloudRegion>& cloudRegions) {
  for (ArrayIndex i = 0; i < regionArray.size(); ++i) {
    const Json::Value& e = regionArray[i];
    CloudRegion r;
    r.circle_b = e["circle_b"].asBool();
    r.channel = e["channel"].asUInt();
    keepIfNotEmpty(e["uid"], r.uid);
    keepIfNotEmpty(e["regionName"], r.name);
    keepIfNotEmpty(e["regionRefName"], r.refName);
    r.bgColor = e["bg_color"].asString();
    if (r.circle_b) {
      r.x = e["x"].asUInt();
      r.y = e["y"].asUInt();
      r.circle_radius = e["circle_radius"].asUInt();
    } else {
      r.x1 = e["x1"].asUInt();
      r.y1 = e["y1"].asUInt();
      r.x2 = e["x2"].asUInt();
      r.y2 = e["y2"].asUInt();
    }
    r.backgroundCorrected = e["bg_corrected"].asBool();
    cloudRegions.push_back(std::move(r));
  }
  for (const Region2D& r : toRegion2DList(cloudRegions)) regions2d.push_back(r);
}

namespace {

// x1 of the first frame whose uid names frameId; 0 when no frame does.
int32_t markerFrameX(const std::string& frameId, const std::vector<CloudFrame>& cloudFrames) {
  for (const CloudFrame& f : cloudFrames) {
    if (equalsNoCase(f.uid, frameId)) return static_cast<int32_t>(f.x1);
  }
  return 0;
}

// Middle row of the first band whose uid names bandId (frames, lanes, bands in order);
// 0 when no band does. Worked in signed arithmetic so that a box given bottom-up still
// yields its middle instead of a wrapped unsigned difference.
int32_t markerBandY(const std::string& bandId,
                    const std::vector<std::vector<CloudLane>>& cloudLanes) {
  for (const std::vector<CloudLane>& lanes : cloudLanes) {
    for (const CloudLane& lane : lanes) {
      for (const CloudBand& band : lane.bands) {
        if (!equalsNoCase(band.uid, bandId)) continue;
        const int64_t y1 = band.y1;
        const int64_t y2 = band.y2;
        return static_cast<int32_t>(y1 + (y2 - y1) / 2);
      }
    }
  }
  return 0;
}

}  // namespace

std::vector<MarkerWeightMap> decodeMarkerWeights(
    const Json::Value& array, const std::vector<CloudFrame>& cloudFrames,
    const std::vector<std::vector<CloudLane>>& cloudLanes) {
  std::vector<MarkerWeightMap> maps;
  for (ArrayIndex i = 0; i < array.size(); ++i) {
    const Json::Value& markerFrame = array[i];
    const int32_t frameX = markerFrameX(markerFrame["frameId"].asString(), cloudFrames);
    MarkerWeightMap map;
    const Json::Value& markerLanes = markerFrame["mwMarkerLane"];
    for (ArrayIndex j = 0; j < markerLanes.size(); ++j) {
      const Json::Value& markerBands = markerLanes[j]["mwMarkerBand"];
      for (ArrayIndex k = 0; k < markerBands.size(); ++k) {
        const Json::Value& markerBand = markerBands[k];
        const int32_t bandY = markerBandY(markerBand["bandId"].asString(), cloudLanes);
        const float weight = markerBand["mwMarkerWt"].asFloat();
        map[weight].emplace_back(frameX, bandY);
      }
    }
    maps.push_back(std::move(map));
  }
  return maps;
}

}  // namespace api
}  // namespace viraduve
