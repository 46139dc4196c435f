// Total-protein normalisation, rolling-ball measures and region analysis from request to
// answer, as a host calls them.
#include <gtest/gtest.h>

#include <filesystem>
#include <sstream>

#include <json/json.h>
#include <opencv2/imgcodecs.hpp>

#include "synth.h"
#include "test_support.h"
#include "viraduve/viraduve.h"

namespace viraduve {
namespace {

using test::StdoutCapture;
using test::TempDir;

std::string taken(char* answer) {
  const std::string text = answer == nullptr ? "<null>" : answer;
  releaseResult(answer);
  return text;
}

Json::Value parse(const std::string& text) {
  Json::Value v;
  std::istringstream(text) >> v;
  return v;
}

std::string text(const Json::Value& v) { return Json::writeString(Json::StreamWriterBuilder(), v); }

// Three lanes of a clean gel, the middle one with half the protein; lanes 0 and 1 are named
// for normalisation over the whole frame height, lane 2 is not.
struct TpnGel {
  TempDir dir;
  Json::Value frame;
  std::string tpn;
  TpnGel() {
    synth::CaptureSpec plan = synth::cleanGel(240, 200, 3, 2, 7);
    for (synth::BandSpec& b : plan.frames[0].lanes[1].bands) b.volume *= 0.5;
    frame = parse(synth::truthFrameJson(synth::writeCapture(plan, dir.path()), 0));
    Json::Value& f = frame["analysisFrame"];
    for (Json::Value& lane : f["roiList"])
      for (Json::Value& band : lane["bands"]) band["volume"] = 1000.0;
    Json::Value request;
    Json::Value& entry = request["frameList"][0];
    for (const char* k : {"x1", "x2", "y1", "y2"}) entry["analysisFrameRoi"][k] = f[k];
    for (int j = 0; j < 2; ++j) {
      Json::Value& named = entry["normalizeLanes"][j];
      named["laneVolTop"]["y1"] = f["y1"];
      named["laneVolBottom"]["y2"] = f["y2"];
      for (const char* k : {"x1", "x2", "y1", "y2"}) named["laneRoi"][k] = f["roiList"][j]["lane"][k];
    }
    tpn = text(request);
  }
  std::string call(const std::string& frames, const char* mode, const std::string& tpnText,
                   const std::string& paras) {
    // The driver reads "tpn.cfg" from the current folder: call from an empty one.
    TempDir cwd;
    const std::filesystem::path saved = std::filesystem::current_path();
    std::filesystem::current_path(cwd.path());
    const std::string answer = taken(getTPNAnalysisData(dir.path().c_str(), frames.c_str(), mode,
                                                        tpnText.c_str(), paras.c_str()));
    std::filesystem::current_path(saved);
    return answer;
  }
};

TEST(TpnFlow, NormalisesTheNamedLanesInEitherFrameShape) {
  TpnGel gel;
  const std::string paras = synth::imageParasJson(1);
  Json::Value list(Json::arrayValue);
  list.append(gel.frame);
  const std::string answer = gel.call(text(gel.frame), "protein", gel.tpn, paras);
  EXPECT_EQ(gel.call(text(list), "protein", gel.tpn, paras), answer);

  const Json::Value lanes = parse(answer)["frameLanesBands"][0]["lanes"];
  ASSERT_EQ(lanes.size(), 3u);
  EXPECT_EQ(lanes[0]["lane"]["norm_factor"].asDouble(), 1.0);  // the strongest named lane
  EXPECT_NEAR(lanes[1]["lane"]["norm_factor"].asDouble(), 0.5, 0.1);
  for (int j = 0; j < 2; ++j) {
    const Json::Value& lane = lanes[j]["lane"];
    EXPECT_NEAR(lane["lane_background_volume"].asDouble(),
                lane["lane_volume"].asDouble() - lane["lane_adjusted_volume"].asDouble(), 1e-3);
    for (const Json::Value& band : lanes[j]["bands"])
      EXPECT_DOUBLE_EQ(band["volume_norm"].asDouble(), 1000.0 / lane["norm_factor"].asDouble());
  }
  // The lane named by no element keeps what the request held.
  EXPECT_EQ(lanes[2]["lane"]["norm_factor"].asDouble(), 0.0);
  EXPECT_EQ(lanes[2]["bands"][0]["volume_norm"].asDouble(), 0.0);
}

TEST(TpnFlow, EveryRefusalAnswersError) {
  TpnGel gel;
  const std::string paras = synth::imageParasJson(1), frame = text(gel.frame);
  const struct {
    const char* mode;
    std::string frame, tpn, paras;
    const char* line;
  } cases[] = {
      {"Unknown", frame, gel.tpn, paras, ""},
      {"protein", frame, gel.tpn, "{", "Failed to parse image params\n"},
      {"protein", "[", gel.tpn, paras, "Failed to parse analysis Frame\n"},
      {"protein", frame, "", paras, "Failed to parse request object from ui\n"},
  };
  for (const auto& c : cases) {
    StdoutCapture out;
    EXPECT_EQ(gel.call(c.frame, c.mode, c.tpn, c.paras), "error");
    const std::string log = out.finish();
    EXPECT_NE(log.find(c.line), std::string::npos) << log;  // followed by the reader's text
    EXPECT_NE(log.find("std::exception\nERROR in __FUNCTION__ = getTPNAnalysisData\n"),
              std::string::npos)
        << log;
  }
}

TEST(RollingBallFlow, MeasuresRawVolumesWithThePerChannelRadius) {
  TempDir dir;
  const synth::Truth truth = synth::writeCapture(synth::cleanGel(240, 200, 3, 2, 9), dir.path());
  const std::string paras = synth::imageParasJson(1);
  Json::Value frame = parse(synth::truthFrameJson(truth, 0));
  auto call = [&](const Json::Value& f) {
    return parse(taken(getRollingBallOnAnalysedData(dir.path().c_str(), text(f).c_str(),
                                                    "protein", nullptr, paras.c_str())));
  };
  const Json::Value a = call(frame)["frameLanesBands"][0]["lanes"];
  frame["analysisFrame"]["rollingBall"][0]["channel"] = 0;
  frame["analysisFrame"]["rollingBall"][0]["radius"] = 3;
  const Json::Value b = call(frame)["frameLanesBands"][0]["lanes"];

  const cv::Mat pixels = cv::imread(dir.file("ch0.tif"), cv::IMREAD_UNCHANGED);
  ASSERT_EQ(a.size(), 3u);
  for (Json::ArrayIndex j = 0; j < a.size(); ++j) {
    double purity = 0.0;
    for (Json::ArrayIndex k = 0; k < a[j]["bands"].size(); ++k) {
      const Json::Value& band = a[j]["bands"][k];
      const int x1 = band["x1"].asInt(), y1 = band["y1"].asInt();
      const cv::Rect box(x1, y1, band["x2"].asInt() - x1 + 1, band["y2"].asInt() - y1 + 1);
      EXPECT_EQ(band["volume"].asDouble(), cv::sum(pixels(box))[0]);
      EXPECT_NE(band["rolling_bg_volume"], b[j]["bands"][k]["rolling_bg_volume"]);
      purity += band["purity_band"].asDouble();
    }
    EXPECT_NEAR(purity, 1.0, 1e-6);
  }
  StdoutCapture out;
  EXPECT_EQ(getRollingBallOnAnalysedData(dir.path().c_str(), "{", "protein", nullptr, paras.c_str()),
            nullptr);
  EXPECT_NE(out.finish().find("Failed to parse analysis Frame\n"), std::string::npos);
}

// 60 x 40: columns 0..24 at 1000, the rest at 3000 with a 4 x 4 block of 9000.
struct RegionCapture {
  TempDir dir;
  RegionCapture() {
    cv::Mat m(40, 60, CV_16UC1, cv::Scalar(3000));
    m.colRange(0, 25).setTo(1000);
    m(cv::Rect(40, 10, 4, 4)).setTo(9000);
    test::writeImage(dir.file("ch0.tif"), m);
  }
  std::string call(const char* regions, const std::string& paras, const char* bg) {
    return taken(getRegionAnalysis(dir.path().c_str(), regions, "protein", nullptr, paras.c_str(), bg));
  }
};

const char kRegions[] = R"({"region_list": [
  {"circle_b": false, "channel": 0, "uid": "r1", "regionName": "block", "regionRefName": "ref",
   "bg_color": "red", "x1": 40, "y1": 10, "x2": 43, "y2": 13, "bg_corrected": true},
  {"circle_b": true, "channel": 0, "x": 10, "y": 20, "circle_radius": 3}]})";

TEST(RegionFlow, GlobalBackgroundFromTheChosenRegion) {
  RegionCapture capture;
  const std::string paras = synth::imageParasJson(1);
  const struct {
    const char* bg;
    const char* line;
    double background;
  } cases[] = {
      {nullptr, "::::::No BackGround Region set ::::\n", 3000},  // near-median of the image
      {R"({"bgRegion": {"circle_b": false, "x1": 0, "y1": 0, "x2": 9, "y2": 9}})",
       "::::::Rectangle Background Region Called ::::\n", 1000},
      {R"({"bgRegion": {"circle_b": true, "x": 50, "y": 30, "circle_radius": 4}})",
       "::::::Circle BackGround Region Called ::::\n", 3000},
      {R"({"bgRegion": {"circle_b": true, "circle_radius": 4}})",  // centre (0, 0)
       "::::::Circle BackGround Region Called ::::\n", 1000},
  };
  for (const auto& c : cases) {
    StdoutCapture out;
    const Json::Value regions = parse(capture.call(kRegions, paras, c.bg))["cloud_region_list"];
    EXPECT_NE(out.finish().find(c.line), std::string::npos) << c.line;
    ASSERT_EQ(regions.size(), 2u);
    EXPECT_EQ(regions[0]["name"].asString(), "block");
    EXPECT_EQ(regions[0]["bgColor"].asString(), "red");
    EXPECT_EQ(regions[0]["volume"].asDouble(), 16 * 9000.0);
    EXPECT_EQ(regions[0]["global_bg_volume"].asDouble(), 16 * (9000.0 - c.background));
    EXPECT_EQ(regions[0]["purity"].asDouble(), 1.0);
    EXPECT_EQ(regions[1]["area"].asDouble(), 25.0);  // pixels strictly inside radius 3
    EXPECT_EQ(regions[1]["volume"].asDouble(), 25 * 1000.0);
  }
}

TEST(RegionFlow, UnusableBackgroundsAndStraightenedFiles) {
  RegionCapture capture;
  Json::Value paras = parse(synth::imageParasJson(1));
  {
    StdoutCapture out;
    EXPECT_EQ(capture.call(kRegions, text(paras), ""), "<null>");
    EXPECT_NE(out.finish().find("Failed to parse Global BG Region \n"), std::string::npos);
  }
  // A background circle without pixels, a background rectangle outside the image.
  for (const char* bg : {R"({"bgRegion": {"circle_b": true, "x": 500, "y": 500, "circle_radius": 4}})",
                         R"({"bgRegion": {"circle_b": false, "x1": 50, "y1": 0, "x2": 70, "y2": 9}})"}) {
    EXPECT_EQ(capture.call(kRegions, text(paras), bg), "error");
  }
  // Mirrored before measuring: the block now lies at columns 16..19, also on disk.
  paras["ImageParas"][0]["img_flip_h"] = true;
  const Json::Value regions = parse(capture.call(
      R"({"region_list": [{"channel": 0, "x1": 16, "y1": 10, "x2": 19, "y2": 13}]})", text(paras),
      nullptr))["cloud_region_list"];
  EXPECT_EQ(regions[0]["volume"].asDouble(), 16 * 9000.0);
  EXPECT_EQ(cv::imread(capture.dir.file("ch0.tif"), cv::IMREAD_UNCHANGED).at<ushort>(10, 16), 9000);
}

}  // namespace
}  // namespace viraduve
