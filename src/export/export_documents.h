// The request documents only the export reads: export attributes, user annotations, the
// overlay list, the text list and the total-protein export frames, with their decoders.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include <json/json.h>

namespace viraduve {
namespace Export {

struct ExportAttributes {
  bool exportLayers = false;
  uint32_t format = 0;            // 1 png, 2 jpg, 3 and anything else tif
  uint32_t channelSelection = 0;  // 1 or 3: merge the listed channels into "overlay"
  uint32_t dpi = 0;
  float height = 0.0f;            // printed size in centimetres
  float width = 0.0f;
  bool exportAnnotation = false;
  bool exportMarkers = false;
};

struct Annotation {
  int32_t x1 = 0;
  int32_t x2 = 0;
  int32_t y1 = 0;
  int32_t y2 = 0;
  float angle = 0.0f;  // degrees, counter-clockwise (the request's radians with the sign reversed)
  std::string type;
  std::string textColor;
  int32_t exportTextSize = 0;
  std::string fillColor;
  std::vector<std::string> text;
};

struct ChannelAnnotations {
  uint32_t channel = 0;
  std::vector<Annotation> annotations;
};

struct LaneVolumeBox {
  uint32_t x1 = 0;
  uint32_t x2 = 0;
  uint32_t y1 = 0;
  uint32_t y2 = 0;
};

struct TpnExportLane {
  LaneVolumeBox laneVolTop;
  std::string uid;
  LaneVolumeBox laneVolBottom;
};

struct TpnExportFrame {
  std::string uid;
  uint32_t channel = 0;
  TpnExportLane referanceLane;
  std::vector<TpnExportLane> normalizeLanes;
  std::vector<TpnExportLane> excludedLanes;
};

// The value of "exportAttribute". Missing keys read as zero / false.
ExportAttributes decodeExportAttributes(const Json::Value& attribute);
// The "annotationAttribute" array.
std::vector<ChannelAnnotations> decodeAnnotations(const Json::Value& array);
// The "overlayList" array; logs every element as "overlayList[i]: value".
std::vector<uint32_t> decodeOverlayList(const Json::Value& array);
// A root array of texts.
std::vector<std::string> decodeTextList(const Json::Value& array);
// A root array of total-protein export frames.
std::vector<TpnExportFrame> decodeTpnExportFrames(const Json::Value& array);

}  // namespace Export
}  // namespace viraduve
