// Decoding of the export-only request documents. Keys are read with JsonCpp's own
// conversions, so a value of the wrong kind raises the JSON library's error and ends the call.
#include "export/export_documents.h"

#include "common/log.h"

namespace viraduve {
namespace Export {

namespace {

LaneVolumeBox decodeBox(const Json::Value& box) {
  LaneVolumeBox b;
  b.x1 = box["x1"].asUInt();
  b.x2 = box["x2"].asUInt();
  b.y1 = box["y1"].asUInt();
  b.y2 = box["y2"].asUInt();
  return b;
}

TpnExportLane decodeTpnLane(const Json::Value& lane) {
  TpnExportLane l;
  l.laneVolTop = decodeBox(lane["laneVolTop"]);
  l.uid = lane["uid"].asString();
  l.laneVolBottom = decodeBox(lane["laneVolBottom"]);
  return l;
}

std::vector<TpnExportLane> decodeTpnLanes(const Json::Value& lanes) {
  std::vector<TpnExportLane> out;
  for (Json::ArrayIndex i = 0; i < lanes.size(); ++i) out.push_back(decodeTpnLane(lanes[i]));
  return out;
}

Annotation decodeAnnotation(const Json::Value& v) {
  Annotation a;
  const Json::Value& roi = v["roi"];
  a.x1 = roi["x1"].asInt();
  a.y1 = roi["y1"].asInt();
  a.x2 = roi["x2"].asInt();
  a.y2 = roi["y2"].asInt();
  a.angle = v["angle"].asFloat() * -57.29578f;
  a.type = v["type"].asString();
  a.textColor = v["textColor"].asString();
  a.exportTextSize = v["exportTextSize"].asInt();
  a.fillColor = v["fillColor"].asString();
  const Json::Value& text = v["text"];
  for (Json::ArrayIndex i = 0; i < text.size(); ++i) a.text.push_back(text[i].asString());
  return a;
}

}  // namespace

ExportAttributes decodeExportAttributes(const Json::Value& attribute) {
  ExportAttributes e;
  e.exportLayers = attribute.get("exportLayers", false).asBool();
  e.format = attribute.get("format", 0u).asUInt();
  e.channelSelection = attribute.get("channelSelection", 0u).asUInt();
  e.dpi = attribute.get("dpi", 0u).asUInt();
  e.height = attribute.get("height", 0.0f).asFloat();
  e.width = attribute.get("width", 0.0f).asFloat();
  e.exportAnnotation = attribute.get("exportAnnotation", false).asBool();
  e.exportMarkers = attribute.get("exportMarkers", false).asBool();
  return e;
}

std::vector<ChannelAnnotations> decodeAnnotations(const Json::Value& array) {
  std::vector<ChannelAnnotations> out;
  for (Json::ArrayIndex i = 0; i < array.size(); ++i) {
    const Json::Value& entry = array[i];
    ChannelAnnotations c;
    c.channel = entry["channel"].asUInt();
    const Json::Value& list = entry["Annotation"];
    for (Json::ArrayIndex j = 0; j < list.size(); ++j) c.annotations.push_back(decodeAnnotation(list[j]));
    out.push_back(std::move(c));
  }
  return out;
}

std::vector<uint32_t> decodeOverlayList(const Json::Value& array) {
  std::vector<uint32_t> out;
  for (Json::ArrayIndex i = 0; i < array.size(); ++i) {
    out.push_back(array[i].asUInt());
    logLine("overlayList[", i, "]: ", out.back());
  }
  return out;
}

std::vector<std::string> decodeTextList(const Json::Value& array) {
  std::vector<std::string> out;
  for (Json::ArrayIndex i = 0; i < array.size(); ++i) out.push_back(array[i].asString());
  return out;
}

std::vector<TpnExportFrame> decodeTpnExportFrames(const Json::Value& array) {
  std::vector<TpnExportFrame> out;
  for (Json::ArrayIndex i = 0; i < array.size(); ++i) {
    const Json::Value& v = array[i];
    TpnExportFrame f;
    f.uid = v["uid"].asString();
    f.channel = v["channel"].asUInt();
    f.referanceLane = decodeTpnLane(v["referanceLane"]);
    f.normalizeLanes = decodeTpnLanes(v["normalizeLanes"]);
    f.excludedLanes = decodeTpnLanes(v["excludedLanes"]);
    out.push_back(std::move(f));
  }
  return out;
}

}  // namespace Export
}  // namespace viraduve
