#include "summary.h"

#include <cstdarg>
#include <cstdio>
#include <memory>
#include <stdexcept>

#include <json/json.h>

namespace viraduve {
namespace cli {

namespace {

Json::Value parseAnswer(const std::string& json) {
  // Answers may hold the bare tokens NaN and Infinity.
  Json::CharReaderBuilder builder;
  builder["allowSpecialFloats"] = true;
  std::unique_ptr<Json::CharReader> reader(builder.newCharReader());
  Json::Value root;
  std::string errors;
  if (!reader->parse(json.data(), json.data() + json.size(), &root, &errors))
    throw std::runtime_error("the answer is not JSON: " + errors);
  return root;
}

std::string box(const Json::Value& v) {
  char buf[96];
  std::snprintf(buf, sizeof buf, "(%u,%u)-(%u,%u)", v["x1"].asUInt(), v["y1"].asUInt(),
                v["x2"].asUInt(), v["y2"].asUInt());
  return buf;
}

std::string row(const char* format, ...) __attribute__((format(printf, 1, 2)));
std::string row(const char* format, ...) {
  char buf[512];
  va_list args;
  va_start(args, format);
  std::vsnprintf(buf, sizeof buf, format, args);
  va_end(args);
  return std::string(buf) + "\n";
}

}  // namespace

std::string summariseAnswer(const std::string& json) {
  const Json::Value root = parseAnswer(json);
  std::string out;
  if (root.isObject() && root.isMember("frameLanesBands")) {
    out += row("%5s %5s %5s %7s  %-23s %16s %16s %16s", "frame", "lane", "band", "channel",
               "position", "volume", "bg-corrected", "normalised");
    const Json::Value& frames = root["frameLanesBands"];
    for (Json::ArrayIndex f = 0; f < frames.size(); ++f) {
      const Json::Value& lanes = frames[f]["lanes"];
      for (Json::ArrayIndex l = 0; l < lanes.size(); ++l) {
        const Json::Value& bands = lanes[l]["bands"];
        for (Json::ArrayIndex b = 0; b < bands.size(); ++b) {
          const Json::Value& band = bands[b];
          out += row("%5u %5u %5u %7u  %-23s %16.2f %16.2f %16.2f", f, l, b, band["channel"].asUInt(),
                     box(band).c_str(), band["volume"].asDouble(),
                     band["local_bg_volume"].asDouble(), band["volume_norm"].asDouble());
        }
      }
    }
    return out;
  }
  if (root.isObject() && root.isMember("cloud_region_list")) {
    out += row("%6s %7s %-7s %-23s %16s %16s", "region", "channel", "shape", "position", "volume",
               "bg-corrected");
    const Json::Value& regions = root["cloud_region_list"];
    for (Json::ArrayIndex r = 0; r < regions.size(); ++r) {
      const Json::Value& region = regions[r];
      std::string where;
      if (region["circle_b"].asBool()) {
        char buf[96];
        std::snprintf(buf, sizeof buf, "(%u,%u) r %u", region["x"].asUInt(), region["y"].asUInt(),
                      region["circle_radius"].asUInt());
        where = buf;
      } else {
        where = box(region);
      }
      out += row("%6u %7u %-7s %-23s %16.2f %16.2f", r, region["channel"].asUInt(),
                 region["circle_b"].asBool() ? "circle" : "rect", where.c_str(),
                 region["volume"].asDouble(), region["local_bg_volume"].asDouble());
    }
    return out;
  }
  throw std::runtime_error("the answer holds neither frames nor regions");
}

}  // namespace cli
}  // namespace viraduve
