#include "documents.h"

#include <algorithm>
#include <cctype>
#include <cstdio>
#include <filesystem>
#include <fstream>
#include <iostream>
#include <iterator>
#include <sstream>

#include <json/json.h>
#include <opencv2/imgcodecs.hpp>

namespace viraduve {
namespace cli {

namespace fs = std::filesystem;

namespace {

std::string readAll(std::istream& in) {
  return std::string(std::istreambuf_iterator<char>(in), std::istreambuf_iterator<char>());
}

// The first of JsonCpp's formatted errors ("* Line 1, Column 2\n  Missing '}' ...") on one line.
std::string firstError(const std::string& text) {
  std::istringstream in(text);
  std::string where, what;
  std::getline(in, where);
  std::getline(in, what);
  if (where.rfind("* ", 0) == 0) where.erase(0, 2);
  const auto start = what.find_first_not_of(' ');
  what = start == std::string::npos ? "" : what.substr(start);
  return what.empty() ? where : where + ": " + what;
}

std::string lowerAscii(std::string s) {
  for (char& c : s)
    if (c >= 'A' && c <= 'Z') c = static_cast<char>(c - 'A' + 'a');
  return s;
}

bool contains(const std::string& s, const char* part) { return s.find(part) != std::string::npos; }

bool isInlineDocument(const std::string& value) {
  const auto start = value.find_first_not_of(" \t\r\n");
  return start != std::string::npos && (value[start] == '{' || value[start] == '[');
}

}  // namespace

std::string readDocument(const std::string& option, const std::string& value) {
  if (isInlineDocument(value)) return value;
  if (value == "-") return readAll(std::cin);
  requireReadableFile(value);
  std::ifstream in(value, std::ios::binary);
  std::string text = readAll(in);
  if (in.bad()) throw UsageError("cannot read " + option + " file " + value);
  return text;
}

std::string checkDocument(const std::string& option, const std::string& value,
                          const std::string& text) {
  const std::string origin =
      isInlineDocument(value) ? "inline" : value == "-" ? "standard input" : value;
  // The library's own reader and features, so the check accepts what the library accepts.
  Json::Reader reader;
  Json::Value root;
  if (!reader.parse(text, root, true))
    throw UsageError("invalid JSON in " + option + " (" + origin + "): " +
                     firstError(reader.getFormattedErrorMessages()));
  return text;
}

std::string loadDocument(const std::string& option, const std::string& value) {
  return checkDocument(option, value, readDocument(option, value));
}

void requireFolder(const std::string& dir) {
  std::error_code ec;
  if (dir.empty() || !fs::exists(dir, ec)) throw UsageError("capture folder not found: " + dir);
  if (!fs::is_directory(dir, ec)) throw UsageError("not a folder: " + dir);
}

void requireReadableFile(const std::string& path) {
  std::error_code ec;
  if (!fs::exists(path, ec)) throw UsageError("file not found: " + path);
  if (!fs::is_regular_file(path, ec)) throw UsageError("not a file: " + path);
  std::ifstream in(path, std::ios::binary);
  if (!in) throw UsageError("cannot read file: " + path);
}

std::vector<std::string> channelFiles(const std::string& dir) {
  std::vector<std::string> names;
  std::error_code ec;
  for (fs::directory_iterator it(dir, ec), end; !ec && it != end; it.increment(ec)) {
    const std::string name = it->path().filename().string();
    if (name.rfind("ch", 0) == 0 && it->path().extension() == ".tif") names.push_back(name);
  }
  std::sort(names.begin(), names.end());
  return names;
}

void requireChannelFiles(const std::string& dir) {
  if (channelFiles(dir).empty()) throw UsageError("no channel files (ch0.tif, ...) in " + dir);
}

std::string defaultImageParas(const std::string& dir, const std::string& mode) {
  // The first matching word decides, as the library classifies modes.
  const std::string m = lowerAscii(mode);
  const bool brightBackground =
      contains(m, "vis") ||
      (contains(m, "dna") && !contains(m, "protein") && !contains(m, "chemi") && !contains(m, "uv"));
  Json::Value paras(Json::arrayValue);
  const std::size_t n = channelFiles(dir).size();
  for (std::size_t i = 0; i < n; ++i) {
    Json::Value p(Json::objectValue);
    p["img_angle"] = 0.0;
    p["img_gamma"] = 1.0;
    p["brightness"] = 0;
    p["img_invert"] = false;
    p["img_max"] = 65535;
    p["img_min"] = 0;
    // Grey rendering in the export: white on a dark background, black on a bright one.
    const int grey = brightBackground ? 0 : 255;
    p["r"] = grey;
    p["g"] = grey;
    p["b"] = grey;
    p["img_flip_h"] = false;
    p["img_flip_v"] = false;
    p["saturation"] = false;
    p["backgroundInverted"] = false;
    p["auto_contrast"] = false;
    p["channelAppMode"] = mode;
    p["digitalZoom"] = 1.0;
    p["opticalZoom"] = 1.0;
    p["binning"] = 3;
    p["backgroundDetection"] = brightBackground ? "white" : "black";
    paras.append(p);
  }
  Json::Value root(Json::objectValue);
  root["ImageParas"] = paras;
  Json::StreamWriterBuilder builder;
  builder["indentation"] = "";
  return Json::writeString(builder, root);
}

std::string defaultExportAttributes(const std::string& dir, bool layers, bool annotations,
                                    bool markers, unsigned channelSelection) {
  const std::vector<std::string> files = channelFiles(dir);
  if (files.empty()) throw UsageError("no channel files (ch0.tif, ...) in " + dir);
  const std::string first = (fs::path(dir) / files.front()).string();
  const cv::Mat image = cv::imread(first, cv::IMREAD_UNCHANGED);
  if (image.empty()) throw UsageError("cannot read image " + first);
  // At 254 dpi a centimetre holds 100 pixels; half a pixel more keeps single-precision
  // rounding from losing a column.
  char text[512];
  std::snprintf(text, sizeof text,
                "{\"exportAttribute\": {\"exportLayers\": %s, \"format\": 1, "
                "\"channelSelection\": %u, \"dpi\": 254, \"height\": %.4f, \"width\": %.4f, "
                "\"exportAnnotation\": %s, \"exportMarkers\": %s}}",
                layers ? "true" : "false", channelSelection, (image.rows + 0.5) / 100.0,
                (image.cols + 0.5) / 100.0, annotations ? "true" : "false",
                markers ? "true" : "false");
  return text;
}

std::string allChannelsOverlay(const std::string& dir) {
  std::string list = "{\"overlayList\": [";
  const std::size_t n = channelFiles(dir).size();
  for (std::size_t i = 0; i < n; ++i) list += (i ? ", " : "") + std::to_string(i);
  return list + "]}";
}

}  // namespace cli
}  // namespace viraduve
