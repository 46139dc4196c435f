// Band measures as a host receives them: given lanes, lanes found in a frame and updated
// bands, on synthetic one-, two- and three-channel captures, checked against the pixels of
// the channel files.
#include <gtest/gtest.h>

#include <cmath>
#include <memory>
#include <sstream>
#include <string>
#include <vector>

#include <json/json.h>
#include <opencv2/core.hpp>
#include <opencv2/imgcodecs.hpp>

#include "synth.h"
#include "test_support.h"
#include "viraduve/viraduve.h"

namespace viraduve {
namespace {

using test::StdoutCapture;
using test::TempDir;

// The answer text; "error" and null are returned as they are.
std::string takeText(char* answer) {
  if (answer == nullptr) return "<null>";
  std::string text(answer);
  releaseResult(answer);
  return text;
}

// Answers may hold NaN and Infinity tokens, which strict JSON does not allow.
Json::Value parseFrames(const std::string& text) {
  Json::CharReaderBuilder builder;
  builder["allowSpecialFloats"] = true;
  std::unique_ptr<Json::CharReader> reader(builder.newCharReader());
  Json::Value root;
  std::string errors;
  EXPECT_TRUE(reader->parse(text.data(), text.data() + text.size(), &root, &errors))
      << errors << "\n" << text.substr(0, 200);
  return root["frameLanesBands"];
}

Json::Value parseRequest(const std::string& text) {
  Json::Value v;
  std::istringstream(text) >> v;
  return v;
}

std::string toText(const Json::Value& v) { return Json::writeString(Json::StreamWriterBuilder(), v); }

enum class Entry { BandLane, CustomFrame, UpdateBands };

// Calls one entry point with the library's log kept out of the test output.
std::string call(Entry entry, const std::string& dir, const std::string& frame, const char* mode,
                 const std::string& paras, std::string* log = nullptr) {
  StdoutCapture out;
  char* answer = nullptr;
  switch (entry) {
    case Entry::BandLane:
      answer = getBandLaneAnalysis(dir.c_str(), frame.c_str(), mode, nullptr, paras.c_str());
      break;
    case Entry::CustomFrame:
      answer = getCustomAnalysisFrame(dir.c_str(), frame.c_str(), mode, nullptr, paras.c_str());
      break;
    case Entry::UpdateBands:
      answer = getUpdateBandDetection(dir.c_str(), frame.c_str(), mode, nullptr, paras.c_str());
      break;
  }
  const std::string text = takeText(answer);
  const std::string printed = out.finish();
  if (log != nullptr) *log = printed;
  return text;
}

cv::Mat channelFile(const TempDir& dir, int c) {
  return cv::imread(dir.file("ch" + std::to_string(c) + ".tif"), cv::IMREAD_UNCHANGED);
}

cv::Rect boxOf(const Json::Value& band) {
  const int x1 = band["x1"].asInt(), y1 = band["y1"].asInt();
  return cv::Rect(x1, y1, band["x2"].asInt() - x1 + 1, band["y2"].asInt() - y1 + 1);
}

// The pixel sum of a band box, of the raw picture or of its 16-bit complement.
double boxSum(const cv::Mat& raw, const cv::Rect& box, bool inverted) {
  double sum = 0.0;
  for (int r = box.y; r < box.y + box.height; ++r)
    for (int c = box.x; c < box.x + box.width; ++c) {
      const double v = raw.at<ushort>(r, c);
      sum += inverted ? 65535.0 - v : v;
    }
  return sum;
}

// Checks that hold for every measured band whatever the capture: the answer's measures fit
// the band box and each other.
void expectConsistentBand(const Json::Value& band, const Json::Value& lane) {
  const cv::Rect box = boxOf(band);
  const double area = band["area"].asDouble();
  const double volume = band["volume"].asDouble();
  EXPECT_EQ(area, static_cast<double>(box.area()));
  EXPECT_EQ(band["density"].asDouble(), volume / area);
  EXPECT_EQ(band["local_bg_density"].asDouble(), band["local_bg_volume"].asDouble() / area);
  EXPECT_EQ(band["global_bg_density"].asDouble(), band["global_bg_volume"].asDouble() / area);
  EXPECT_GE(band["local_bg_volume"].asDouble(), 0.0);
  EXPECT_LE(band["local_bg_volume"].asDouble(), volume);
  EXPECT_LE(band["global_bg_volume"].asDouble(), volume);
  EXPECT_EQ(band["rolling_bg_volume"].asDouble(), 0.0);
  EXPECT_EQ(band["rolling_bg_density"].asDouble(), 0.0);
  const int laneY1 = lane["y1"].asInt(), laneY2 = lane["y2"].asInt();
  const int centre = (band["y1"].asInt() + band["y2"].asInt()) / 2;
  const float rf = (static_cast<float>(centre) - static_cast<float>(laneY1)) /
                   (static_cast<float>(laneY2) - static_cast<float>(laneY1));
  EXPECT_EQ(band["rf"].asDouble(), static_cast<double>(rf));
  EXPECT_GT(band["purity_lane"].asDouble(), 0.0);
  EXPECT_LT(band["purity_lane"].asDouble(), 1.0);
}

TEST(AnalysisMeasures, OneChannelUvBandsMatchTheCapture) {
  TempDir dir;
  const synth::Truth truth = synth::writeCapture(synth::cleanGel(320, 260, 4, 3, 11), dir.path());
  const cv::Mat raw = channelFile(dir, 0);
  const Json::Value frames = parseFrames(call(Entry::BandLane, dir.path(),
                                              synth::truthFrameJson(truth, 0), "UV",
                                              synth::imageParasJson(1)));
  ASSERT_EQ(frames.size(), 1u);
  const Json::Value& lanes = frames[0]["lanes"];
  ASSERT_EQ(lanes.size(), truth.frames[0].lanes.size());
  for (Json::ArrayIndex j = 0; j < lanes.size(); ++j) {
    const Json::Value& bands = lanes[j]["bands"];
    ASSERT_EQ(bands.size(), truth.frames[0].lanes[j].bands.size());
    float sloc = 0.0f;
    for (const Json::Value& band : bands) sloc += band["local_bg_volume"].asDouble();
    for (Json::ArrayIndex k = 0; k < bands.size(); ++k) {
      const Json::Value& band = bands[k];
      expectConsistentBand(band, lanes[j]["lane"]);
      EXPECT_EQ(band["volume"].asDouble(), boxSum(raw, boxOf(band), false));
      EXPECT_EQ(band["purity_band"].asDouble(),
                band["local_bg_volume"].asDouble() / static_cast<double>(sloc));
      // The box holds +-2 sigma of the band: most of its volume above the background.
      const double truthVolume = truth.frames[0].lanes[j].bands[k].volume;
      EXPECT_GT(band["local_bg_volume"].asDouble(), 0.8 * truthVolume);
      EXPECT_LT(band["local_bg_volume"].asDouble(), 1.05 * truthVolume);
      EXPECT_GT(band["median_intensity"].asDouble(), band["density"].asDouble() * 0.5);
    }
  }
}

// Chemi: channel 0 has a bright background and is measured inverted; channel 1 as stored.
// The purity of channel 1 divides by the local volumes of both channels' bands.
TEST(AnalysisMeasures, TwoChannelChemiMeasuresEachChannelWithItsPolarity) {
  TempDir dir;
  synth::CaptureSpec plan = synth::cleanGel(300, 240, 3, 2, 5);
  plan.channels = 2;
  plan.channelScale = {1.0, 0.5};
  const synth::Truth truth = synth::writeCapture(plan, dir.path());
  const cv::Mat raw[] = {channelFile(dir, 0), channelFile(dir, 1)};
  const Json::Value frames = parseFrames(call(Entry::BandLane, dir.path(),
                                              synth::truthFrameJson(truth, 0), "chemi",
                                              synth::imageParasJson(2)));
  ASSERT_EQ(frames.size(), 1u);
  for (const Json::Value& lane : frames[0]["lanes"]) {
    float slocChannel0 = 0.0f;
    float slocAll = 0.0f;
    for (const Json::Value& band : lane["bands"]) {
      if (band["channel"].asUInt() == 0) slocChannel0 += band["local_bg_volume"].asDouble();
      slocAll += band["local_bg_volume"].asDouble();
    }
    int perChannel[2] = {0, 0};
    for (const Json::Value& band : lane["bands"]) {
      const unsigned c = band["channel"].asUInt();
      ASSERT_LT(c, 2u);
      ++perChannel[c];
      EXPECT_EQ(band["volume"].asDouble(), boxSum(raw[c], boxOf(band), c == 0));
      EXPECT_EQ(band["area"].asDouble(), static_cast<double>(boxOf(band).area()));
      EXPECT_EQ(band["density"].asDouble(), band["volume"].asDouble() / band["area"].asDouble());
      // Channel 0 was measured while channel 1's bands still held no local volume. Its dark
      // bands on the inverted bright background have none either: 0 / 0 stays NaN.
      const float sloc = c == 0 ? slocChannel0 : slocAll;
      const double purity = band["local_bg_volume"].asDouble() / static_cast<double>(sloc);
      if (std::isnan(purity))
        EXPECT_TRUE(std::isnan(band["purity_band"].asDouble()));
      else
        EXPECT_EQ(band["purity_band"].asDouble(), purity);
      if (c == 1) EXPECT_GT(band["purity_band"].asDouble(), 0.0);
    }
    EXPECT_EQ(perChannel[0], 2);
    EXPECT_EQ(perChannel[1], 2);
  }
}

// Universal: the channel types and the host's inversion flags decide the polarity.
TEST(AnalysisMeasures, UniversalFollowsChannelTypes) {
  TempDir dir;
  synth::CaptureSpec plan = synth::cleanGel(260, 220, 2, 2, 9);
  plan.channels = 3;
  const synth::Truth truth = synth::writeCapture(plan, dir.path());
  Json::Value paras = parseRequest(synth::imageParasJson(3));
  paras["ImageParas"][0]["channelAppMode"] = "Membrane";  // bright background: inverted
  paras["ImageParas"][1]["channelAppMode"] = "Fluo";      // dark background: as stored
  paras["ImageParas"][2]["channelAppMode"] = "Protein";   // dark, but flagged inverted
  paras["ImageParas"][2]["backgroundInverted"] = true;
  const Json::Value frames = parseFrames(call(Entry::BandLane, dir.path(),
                                              synth::truthFrameJson(truth, 0), "universal",
                                              toText(paras)));
  ASSERT_EQ(frames.size(), 1u);
  const bool inverted[] = {true, false, true};
  int measured = 0;
  for (const Json::Value& lane : frames[0]["lanes"]) {
    for (const Json::Value& band : lane["bands"]) {
      const unsigned c = band["channel"].asUInt();
      EXPECT_EQ(band["volume"].asDouble(), boxSum(channelFile(dir, c), boxOf(band), inverted[c]))
          << "channel " << c;
      ++measured;
    }
  }
  EXPECT_EQ(measured, 2 * 2 * 3);
}

TEST(AnalysisMeasures, LanesFoundInAFrameAndUpdatedBandsAreMeasured) {
  TempDir dir;
  const synth::Truth truth = synth::writeCapture(synth::cleanGel(320, 260, 4, 3, 3), dir.path());
  const cv::Mat raw = channelFile(dir, 0);
  // Custom frame: the frame alone. Band update: the lanes, marked for update, without bands.
  Json::Value custom = parseRequest(synth::truthFrameJson(truth, 0));
  custom["analysisFrame"]["roiList"] = Json::Value(Json::arrayValue);
  Json::Value update = parseRequest(synth::truthFrameJson(truth, 0));
  for (Json::Value& lane : update["analysisFrame"]["roiList"]) {
    lane["lane"]["update_flag"] = true;
    lane["bands"] = Json::Value(Json::arrayValue);
  }
  for (Entry entry : {Entry::CustomFrame, Entry::UpdateBands}) {
    const char* name = entry == Entry::CustomFrame ? "custom frame" : "band update";
    const Json::Value& request = entry == Entry::CustomFrame ? custom : update;
    const Json::Value frames =
        parseFrames(call(entry, dir.path(), toText(request), "uv", synth::imageParasJson(1)));
    ASSERT_EQ(frames.size(), 1u) << name;
    EXPECT_EQ(frames[0]["roi"]["uid"].asString(), "frame0");
    const Json::Value& lanes = frames[0]["lanes"];
    EXPECT_EQ(lanes.size(), truth.frames[0].lanes.size()) << name;
    int bands = 0;
    for (const Json::Value& lane : lanes) {
      EXPECT_GE(lane["lane"]["x1"].asInt(), truth.frames[0].x1);
      EXPECT_LE(lane["lane"]["x2"].asInt(), truth.frames[0].x2);
      for (const Json::Value& band : lane["bands"]) {
        expectConsistentBand(band, lane["lane"]);
        EXPECT_EQ(band["volume"].asDouble(), boxSum(raw, boxOf(band), false));
        ++bands;
      }
    }
    EXPECT_GE(bands, 4) << name;
  }
}

TEST(AnalysisMeasures, MismatchedCapturesAnswerError) {
  TempDir three;
  synth::CaptureSpec plan = synth::cleanGel(200, 160, 2, 1, 4);
  plan.channels = 3;
  const std::string frame = synth::truthFrameJson(synth::writeCapture(plan, three.path()), 0);
  // More channel files than parameter sets, and single-channel modes with three files.
  EXPECT_EQ(call(Entry::CustomFrame, three.path(), frame, "chemi", synth::imageParasJson(2)),
            "error");
  EXPECT_EQ(call(Entry::BandLane, three.path(), frame, "uv", synth::imageParasJson(3)), "error");
  EXPECT_EQ(call(Entry::CustomFrame, three.path(), frame, "protein", synth::imageParasJson(3)),
            "error");

  TempDir one;
  plan.channels = 1;
  synth::writeCapture(plan, one.path());
  std::string log;
  EXPECT_EQ(call(Entry::CustomFrame, one.path(), frame, "chemi", synth::imageParasJson(2), &log),
            "error");
  EXPECT_NE(log.find("ERROR! Number of image files is not equal to number of image parameter set"),
            std::string::npos)
      << log;
  EXPECT_EQ(call(Entry::BandLane, one.path(), frame, "chemi", synth::imageParasJson(1), &log),
            "error");
  EXPECT_NE(log.find("This mode needs at least 2 channels"), std::string::npos) << log;
}

}  // namespace
}  // namespace viraduve
