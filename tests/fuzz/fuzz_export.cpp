// The export's own request documents on arbitrary text, then the whole export on a tiny fixed
// capture. The input is split at byte 0x01 into the export attributes, the annotations and
// the overlay list; the other documents are fixed and valid.
#include <unistd.h>

#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <exception>
#include <filesystem>
#include <string>
#include <vector>

#include <json/json.h>
#include <opencv2/core.hpp>
#include <opencv2/imgcodecs.hpp>
#include <opencv2/imgproc.hpp>

#include "api/call_frame.h"
#include "export/export_documents.h"
#include "viraduve/viraduve.h"

namespace {

using namespace viraduve;

std::string capturePath() { return "/tmp/viraduve-fuzz-export-" + std::to_string(getpid()); }

// Created on first use, removed when the fuzzer exits.
const std::string& captureDir() {
  static const std::string dir = [] {
    std::string d = capturePath();
    std::filesystem::create_directories(d);
    std::atexit([] { std::filesystem::remove_all(capturePath()); });
    for (int c = 0; c < 2; ++c) {
      cv::Mat m(24, 32, CV_16UC1, cv::Scalar(3000 + 2000 * c));
      cv::rectangle(m, cv::Rect(6, 5, 6, 3), cv::Scalar(50000), cv::FILLED);
      cv::rectangle(m, cv::Rect(18, 14, 6, 3), cv::Scalar(30000), cv::FILLED);
      cv::imwrite(d + "/ch" + std::to_string(c) + ".tif", m);
    }
    return d;
  }();
  return dir;
}

std::vector<std::string> split(const uint8_t* data, size_t size, std::size_t parts) {
  std::vector<std::string> out(1);
  for (size_t i = 0; i < size; ++i) {
    if (data[i] == 1 && out.size() < parts)
      out.emplace_back();
    else
      out.back().push_back(static_cast<char>(data[i]));
  }
  out.resize(parts);
  return out;
}

void decodeAll(const std::string& text) {
  Json::Value root;
  if (!api::parseJson(text, root, "fuzz")) return;
  const Json::Value& doc = root;
  try {
    Export::decodeExportAttributes(doc["exportAttribute"]);
  } catch (const std::exception&) {
  }
  try {
    Export::decodeAnnotations(doc["annotationAttribute"]);
  } catch (const std::exception&) {
  }
  try {
    Export::decodeOverlayList(doc["overlayList"]);
  } catch (const std::exception&) {
  }
  try {
    Export::decodeTextList(doc);
  } catch (const std::exception&) {
  }
  try {
    Export::decodeTpnExportFrames(doc);
  } catch (const std::exception&) {
  }
}

const char kFrames[] =
    R"([{"analysisFrame": {"x1": 2, "y1": 2, "x2": 29, "y2": 21, "x3": 29, "y3": 2, "x4": 2, "y4": 21,)"
    R"( "uid": "f0", "roiList": [{"lane": {"x1": 9, "y1": 2, "x2": 9, "y2": 21, "width": 8, "uid": "l0"},)"
    R"( "bands": [{"x1": 6, "y1": 5, "x2": 11, "y2": 7, "channel": 0, "uid": "b0"}]}]}}])";
const char kRegions[] =
    R"({"region_list": [{"circle_b": true, "channel": 0, "x": 20, "y": 15, "circle_radius": 4}]})";
const char kParas[] =
    R"({"ImageParas": [{"img_gamma": 1.0, "img_max": 65535, "r": 255, "backgroundDetection": "black"},)"
    R"( {"img_gamma": 0.8, "img_max": 60000, "img_min": 100, "g": 255, "img_invert": true}]})";
const char kTpn[] =
    R"([{"uid": "f0", "channel": 0, "referanceLane": {"laneVolTop": {"x1": 5, "x2": 13, "y1": 2, "y2": 2},)"
    R"( "uid": "l0", "laneVolBottom": {"x1": 5, "x2": 13, "y1": 21, "y2": 21}}}])";
const char kMarkers[] =
    R"({"mwMarkerFrame": [{"frameId": "f0", "mwMarkerLane": [{"mwMarkerBand": [{"bandId": "b0", "mwMarkerWt": 50}]}]}]})";

// The print size the export renders: dpi x centimetres / 2.54 on each side. Requests for
// huge pictures only measure how much memory the machine has, so they are left out.
bool modestPrintSize(const std::string& attributes) {
  Json::Value root;
  Json::Reader reader;
  try {
    if (!reader.parse(attributes, root) || !root.isObject()) return true;
    const Json::Value& a = root["exportAttribute"];
    if (!a.isObject()) return true;
    const double dpi = a.get("dpi", 0u).asDouble();
    const double side = std::max(a.get("height", 0.0).asDouble(), a.get("width", 0.0).asDouble());
    return dpi * side / 2.54 <= 2000.0;
  } catch (const std::exception&) {
    return true;
  }
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  decodeAll(std::string(reinterpret_cast<const char*>(data), size));
  const std::vector<std::string> p = split(data, size, 3);
  if (!modestPrintSize(p[0])) return 0;
  const std::string& dir = captureDir();
  const char* modes[] = {"chemi", "fluo", "universal", "vis"};
  convertAndExportImage(dir.c_str(), kFrames, kRegions, modes[size % 4], nullptr, p[0].c_str(), kParas,
                        p[2].c_str(), p[1].c_str(), static_cast<int>(size & 1), kTpn, kMarkers, "[]",
                        "Windows_NT");
  return 0;
}
