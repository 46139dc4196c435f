#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "api/request_decoding.h"
#include "test_support.h"

namespace viraduve {
namespace api {
namespace {

using test::StdoutCapture;

Json::Value parse(const std::string& text) {
  Json::Value root;
  Json::Reader reader;
  EXPECT_TRUE(reader.parse(text, root)) << text;
  return root;
}

std::vector<CloudImageParam> decodeParas(const std::string& array,
                                         std::vector<ImageParam>* params = nullptr) {
  std::vector<CloudImageParam> cloud;
  std::vector<ImageParam> working;
  decodeImageParas(parse(array), cloud, working);
  EXPECT_EQ(cloud.size(), working.size());
  if (params) *params = working;
  return cloud;
}

struct Frames {
  std::vector<ROI> rois;
  std::vector<std::vector<Lane2D>> lanes2d;
  std::vector<CloudFrame> cloudFrames;
  std::vector<std::vector<CloudLane>> cloudLanes;
};

Frames decodeOneFrame(const std::string& frameObject) {
  Frames f;
  decodeFrame(parse(frameObject), f.rois, f.lanes2d, f.cloudFrames, f.cloudLanes);
  return f;
}

TEST(DecodeImageParas, InversionTurnsRangeAndGamma) {
  // 65535 - 60000 = 5535, 65535 - 1000 = 64535, round(100 / 0.8) / 100 = 1.25.
  std::vector<ImageParam> params;
  const auto cloud = decodeParas(
      R"([{"img_invert": true, "img_min": 1000, "img_max": 60000, "img_gamma": 0.8},
          {"img_invert": true, "img_min": 0, "img_max": 65535, "img_gamma": 3.0},
          {"img_invert": false, "img_min": 1000, "img_max": 60000, "img_gamma": 0.8}])",
      &params);
  ASSERT_EQ(cloud.size(), 3u);
  EXPECT_EQ(cloud[0].img_min, 5535);
  EXPECT_EQ(cloud[0].img_max, 64535);
  EXPECT_EQ(cloud[0].img_gamma, 1.25);
  EXPECT_TRUE(cloud[0].img_invert);
  EXPECT_EQ(cloud[1].img_gamma, 0.33);
  EXPECT_EQ(params[1].img_gamma, 0.33f);
  // Without inversion the gamma is the float reading, widened.
  EXPECT_EQ(cloud[2].img_gamma, static_cast<double>(0.8f));
  EXPECT_EQ(cloud[2].img_min, 1000);
  EXPECT_EQ(params[2].img_gamma, 0.8f);
}

TEST(DecodeImageParas, AbsentKeysReadAsZeroLikeValues) {
  const auto cloud = decodeParas(R"([{}])");
  ASSERT_EQ(cloud.size(), 1u);
  const CloudImageParam& p = cloud[0];
  EXPECT_EQ(p.img_max, 0);  // not the record default 65535
  EXPECT_EQ(p.img_gamma, 0.0);
  EXPECT_EQ(p.digitalZoom, 0.0);
  EXPECT_EQ(p.opticalZoom, 0.0);
  EXPECT_EQ(p.binning, 0);
  EXPECT_EQ(p.channelAppMode, ChType_Live);  // "" classifies as Live, not the default Chemi
  EXPECT_EQ(p.backgroundInverted, 0);
  EXPECT_TRUE(p.backgroundDetection.empty());
}

TEST(DecodeImageParas, EveryKeyReachesItsField) {
  std::vector<ImageParam> params;
  const auto cloud = decodeParas(
      R"([{"img_angle": 1.5, "img_gamma": 2.0, "brightness": -7, "img_max": 50000,
           "img_min": 10, "r": 1, "g": 2, "b": 3, "img_flip_h": true, "img_flip_v": true,
           "saturation": true, "backgroundInverted": true, "auto_contrast": true,
           "channelAppMode": "Fluorescence", "digitalZoom": 1.25, "opticalZoom": 2.5,
           "binning": 4, "backgroundDetection": "auto"}])",
      &params);
  const CloudImageParam& p = cloud.at(0);
  EXPECT_EQ(p.img_angle, 1.5);
  EXPECT_EQ(p.img_gamma, 2.0);
  EXPECT_EQ(p.brightness, -7);
  EXPECT_EQ(p.img_max, 50000);
  EXPECT_EQ(p.img_min, 10);
  EXPECT_EQ(p.r + 10 * p.g + 100 * p.b, 321);
  EXPECT_TRUE(p.img_flip_h && p.img_flip_v && p.saturation && p.auto_contrast);
  EXPECT_EQ(p.backgroundInverted, 1);
  EXPECT_EQ(p.channelAppMode, ChType_Fluo);
  EXPECT_EQ(p.digitalZoom, 1.25);
  EXPECT_EQ(p.opticalZoom, 2.5);
  EXPECT_EQ(p.binning, 4);
  EXPECT_EQ(p.backgroundDetection, "auto");
  const ImageParam& w = params.at(0);
  EXPECT_EQ(w.img_angle, 1.5);
  EXPECT_TRUE(w.img_flip_h && w.img_flip_v);
  EXPECT_EQ(w.channelType, ChType_Fluo);
  EXPECT_EQ(w.backgroundInverted, 1);
}

TEST(DecodeImageParas, RefusedConversionThrowsAndKeepsEarlierElements) {
  std::vector<CloudImageParam> cloud;
  std::vector<ImageParam> params;
  EXPECT_THROW(decodeImageParas(parse(R"([{"img_max": 5}, {"img_max": "abc"}])"), cloud, params),
               Json::LogicError);
  EXPECT_EQ(cloud.size(), 1u);
  EXPECT_TRUE(params.empty());
}

TEST(DecodeFrame, FrameLanesAndBands) {
  StdoutCapture out;
  const Frames f = decodeOneFrame(R"({
    "x1": 10, "y1": 20, "x2": 300, "y2": 400, "x3": 1, "y3": 2, "x4": 3, "y4": 4,
    "sensitivity": [{"channel": 0, "value": 7}, {"channel": 1, "value": 9}],
    "uid": "F1", "annotateText": "not read",
    "roiList": [
      {"lane": {"x1": 50, "y1": 20, "x2": 52, "y2": 400, "width": 30, "update_flag": true,
                "annotateText": "L", "norm_factor": 0.5, "lane_volume": 1.5,
                "lane_background_volume": 2.5, "lane_adjusted_volume": 3.5, "uid": "",
                "num_bands": 9, "lane_s": 4.0, "mw": true},
       "bands": [{"x1": 40, "y1": 30, "x2": 60, "y2": 40, "channel": 1, "band_s_x": 0.1,
                  "band_s_y": 0.2, "band_s_x_raw": 0.3, "area": 1, "volume": 2, "density": 3,
                  "median_intensity": 4, "rf": 5, "purity_band": 6, "purity_lane": 7,
                  "local_bg_volume": 8, "local_bg_density": 9, "global_bg_volume": 10,
                  "global_bg_density": 11, "rolling_bg_volume": 12.5, "rolling_bg_density": 13,
                  "uid": "B1", "wm": 99, "mw_b": true, "annotateText": "no"}]},
      {"lane": {"x1": 90}, "bands": []}
    ]})");
  const std::string log = out.finish();
  EXPECT_NE(log.find("laneSize : 2\n"), std::string::npos);
  EXPECT_NE(log.find("Band size : 1\nBand size : 0\n"), std::string::npos);

  ASSERT_EQ(f.rois.size(), 1u);
  EXPECT_EQ(f.rois[0].x1, 10);
  EXPECT_EQ(f.rois[0].y2, 400);
  const CloudFrame& frame = f.cloudFrames.at(0);
  EXPECT_EQ(frame.x3 + frame.y3 + frame.x4 + frame.y4, 10u);
  ASSERT_EQ(frame.sensitivity.size(), 2u);
  EXPECT_EQ(frame.sensitivity[1].channel, 1u);
  EXPECT_EQ(frame.sensitivity[1].value, 9u);
  EXPECT_EQ(frame.uid, "F1");
  EXPECT_TRUE(frame.annotateText.empty());

  const auto& lanes = f.cloudLanes.at(0);
  ASSERT_EQ(lanes.size(), 2u);
  const CloudLane& lane = lanes[0];
  EXPECT_EQ(lane.width, 30u);
  EXPECT_TRUE(lane.update_flag);
  EXPECT_EQ(lane.annotateText, "L");
  EXPECT_EQ(lane.lane_adjusted_volume, 3.5);
  EXPECT_TRUE(lane.uid.empty());
  // Keys a request does not carry stay at their new-record values.
  EXPECT_EQ(lane.num_bands, 0u);
  EXPECT_EQ(lane.lane_s, 0.0);
  EXPECT_FALSE(lane.mw);
  ASSERT_EQ(lane.bands.size(), 1u);
  const CloudBand& band = lane.bands[0];
  EXPECT_EQ(band.channel, 1u);
  EXPECT_EQ(band.band_s_x_raw, 0.3);
  EXPECT_EQ(band.area, 1.0);
  EXPECT_EQ(band.volume, 2.0);
  EXPECT_EQ(band.rolling_bg_volume, 12.5);
  EXPECT_EQ(band.rolling_bg_density, 13.0);
  EXPECT_EQ(band.uid, "B1");
  EXPECT_EQ(band.wm, 0.0);
  EXPECT_FALSE(band.mw_b);
  EXPECT_TRUE(band.annotateText.empty());
  EXPECT_EQ(lanes[1].x1, 90u);

  const auto& lanes2d = f.lanes2d.at(0);
  ASSERT_EQ(lanes2d.size(), 2u);
  EXPECT_EQ(lanes2d[0].x2, 52);
  EXPECT_TRUE(lanes2d[0].update_flag);
  ASSERT_EQ(lanes2d[0].bands.size(), 1u);
  EXPECT_EQ(lanes2d[0].bands[0].channel, 1u);
  EXPECT_EQ(lanes2d[0].bands[0].rolling_bg_volume, 12.5);
}

TEST(DecodeFrame, EmptyAndMissingParts) {
  StdoutCapture out;
  const Frames f = decodeOneFrame(R"({"x1": 1, "roiList": [], "uid": ""})");
  EXPECT_NE(out.finish().find("laneSize : 0\n"), std::string::npos);
  ASSERT_EQ(f.cloudLanes.size(), 1u);
  EXPECT_TRUE(f.cloudLanes[0].empty());
  EXPECT_TRUE(f.lanes2d[0].empty());
  EXPECT_TRUE(f.cloudFrames[0].sensitivity.empty());
  EXPECT_TRUE(f.cloudFrames[0].uid.empty());
}

TEST(DecodeFrame, ShapeErrors) {
  const struct {
    const char* frame;
    bool throws;
  } cases[] = {
      {R"({"x1": -1})", true},                                     // refused by the uint reading
      {R"({"roiList": [{"bands": [{"y2": -1}]}]})", true},           // same in a band
      {R"({"roiList": [{"lane": [1, 2]}]})", true},                  // array where an object belongs
      {R"({"roiList": [{"lane": 5}]})", true},                       // scalar where an object belongs
      {R"({"x1": {"a": 1}})", true},                                 // object read as a number
      {R"({"sensitivity": 5, "roiList": "lanes"})", false},          // scalars where arrays belong
  };
  for (const auto& c : cases) {
    Frames f;
    const Json::Value root = parse(c.frame);
    if (c.throws) {
      EXPECT_THROW(decodeFrame(root, f.rois, f.lanes2d, f.cloudFrames, f.cloudLanes),
                   Json::LogicError)
          << c.frame;
      // A frame that fails half way appends nothing.
      EXPECT_TRUE(f.rois.empty() && f.lanes2d.empty() && f.cloudFrames.empty() &&
                  f.cloudLanes.empty());
    } else {
      decodeFrame(root, f.rois, f.lanes2d, f.cloudFrames, f.cloudLanes);
      EXPECT_TRUE(f.cloudFrames.at(0).sensitivity.empty());
      EXPECT_TRUE(f.cloudLanes.at(0).empty());
    }
  }
}

TEST(DecodeFrame, ObjectLookupInArrayNamesTheLibraryRule) {
  Frames f;
  try {
    decodeFrame(parse(R"([1, 2])"), f.rois, f.lanes2d, f.cloudFrames, f.cloudLanes);
    FAIL() << "no exception";
  } catch (const Json::LogicError& e) {
    EXPECT_NE(std::string(e.what()).find("requires objectValue or nullValue"), std::string::npos);
  }
}

TEST(DecodeFrame, FrameOnlyAndFrameList) {
  std::vector<ROI> rois;
  std::vector<CloudFrame> frames;
  decodeFrameOnly(parse(R"({"x1": 5, "y1": 6, "x2": 7, "y2": 8, "uid": "u",
                            "roiList": [{"lane": {"x1": -1}}]})"),
                  rois, frames);
  ASSERT_EQ(rois.size(), 1u);
  EXPECT_EQ(rois[0].y1, 6);
  EXPECT_EQ(frames.at(0).uid, "u");

  StdoutCapture out;
  Frames f;
  decodeFrameList(parse(R"([{"analysisFrame": {"x1": 1}}, {"analysisFrame": {"x1": 2}}])"),
                  f.rois, f.lanes2d, f.cloudFrames, f.cloudLanes);
  EXPECT_NE(out.finish().find("analysisFrame List Size: 2\n"), std::string::npos);
  ASSERT_EQ(f.rois.size(), 2u);
  EXPECT_EQ(f.rois[1].x1, 2);
  EXPECT_EQ(f.cloudLanes.size(), 2u);
}

TEST(DecodeRegions, CircleAndRectangleWithTexts) {
  std::vector<Region2D> regions;
  std::vector<CloudRegion> cloud;
  decodeRegions(parse(R"([
      {"circle_b": true, "channel": 1, "uid": "R1", "regionName": "spot", "regionRefName": "",
       "bg_color": "#ff0000", "x": 30, "y": 40, "circle_radius": 5, "x1": 99,
       "bg_corrected": true},
      {"circle_b": false, "channel": 0, "x1": 1, "y1": 2, "x2": 3, "y2": 4, "x": 99}])"),
                regions, cloud);
  ASSERT_EQ(cloud.size(), 2u);
  ASSERT_EQ(regions.size(), 2u);
  EXPECT_EQ(cloud[0].uid, "R1");
  EXPECT_EQ(cloud[0].name, "spot");
  EXPECT_TRUE(cloud[0].refName.empty());
  EXPECT_EQ(cloud[0].bgColor, "#ff0000");
  EXPECT_TRUE(cloud[0].backgroundCorrected);
  // Only the shape's own keys are read.
  EXPECT_EQ(cloud[0].x1, 0u);
  EXPECT_EQ(regions[0].circle_radius, 5u);
  EXPECT_EQ(regions[0].channel, 1u);
  EXPECT_EQ(cloud[1].x, 0u);
  EXPECT_EQ(regions[1].x2, 3u);
  EXPECT_EQ(regions[1].y2, 4u);
  EXPECT_FALSE(cloud[1].backgroundCorrected);
}

TEST(DecodeMarkerWeights, FramesBandsAndWeights) {
  std::vector<CloudFrame> frames(2);
  frames[0].uid = "frame-A";
  frames[0].x1 = 11;
  frames[1].uid = "frame-B";
  frames[1].x1 = 22;
  std::vector<std::vector<CloudLane>> lanes(2);
  lanes[1].resize(1);
  CloudBand b1;
  b1.uid = "band-1";
  b1.y1 = 10;
  b1.y2 = 15;  // middle 10 + 5 / 2 = 12
  CloudBand b2;
  b2.uid = "band-2";
  b2.y1 = 40;
  b2.y2 = 30;  // given bottom-up: still the middle row
  lanes[1][0].bands = {b1, b2};

  const auto maps = decodeMarkerWeights(parse(R"([
      {"frameId": "FRAME-b", "mwMarkerLane": [
          {"mwMarkerBand": [{"bandId": "BAND-1", "mwMarkerWt": 50.5},
                            {"bandId": "nothing", "mwMarkerWt": 10}]},
          {"mwMarkerBand": [{"bandId": "band-2", "mwMarkerWt": 50.5}]}]},
      {"frameId": "unknown", "mwMarkerLane": [{"mwMarkerBand": [{"bandId": "band-1"}]}]}])"),
                                        frames, lanes);
  ASSERT_EQ(maps.size(), 2u);
  const MarkerWeightMap& m = maps[0];
  ASSERT_EQ(m.size(), 2u);
  EXPECT_EQ(m.begin()->first, 10.0f);  // ascending weights
  EXPECT_EQ(m.at(10.0f), (std::vector<std::pair<int32_t, int32_t>>{{22, 0}}));
  EXPECT_EQ(m.at(50.5f), (std::vector<std::pair<int32_t, int32_t>>{{22, 12}, {22, 35}}));
  // No frame of that name: frame x 0.
  EXPECT_EQ(maps[1].at(0.0f), (std::vector<std::pair<int32_t, int32_t>>{{0, 12}}));
}

}  // namespace
}  // namespace api
}  // namespace viraduve
