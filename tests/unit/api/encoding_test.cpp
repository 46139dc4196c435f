#include <gtest/gtest.h>

#include <cmath>
#include <limits>
#include <string>

#include "api/response_encoding.h"

namespace viraduve {
namespace api {
namespace {

TEST(EncodeFrames, EmptyList) {
  EXPECT_EQ(encodeFrames({}), "{\n    \"frameLanesBands\": []\n}");
  EXPECT_EQ(encodeRegions({}), "{\n    \"cloud_region_list\": []\n}");
}

// The whole text of a small answer: member order, indentation, number, token and escape forms.
TEST(EncodeFrames, ByteForByte) {
  CloudFrameLanes frame;
  frame.roi.x1 = 1;
  frame.roi.y1 = 2;
  frame.roi.x2 = 300;
  frame.roi.y2 = 4294967295u;
  frame.roi.sensitivity.push_back({1, 5});
  frame.roi.uid = "a\"b\\c/";
  frame.roi.annotateText = "line\nnext\x01\t\xc3\xa9";
  CloudLane lane;
  lane.x1 = 7;
  lane.width = 30;
  lane.num_bands = 1;
  lane.lane_s = 0.25;
  lane.mw = true;
  lane.uid = "L";
  lane.norm_factor = 1.0;
  lane.lane_volume = 123456789.125;
  CloudBand band;
  band.channel = 2;
  band.y2 = 9;
  band.mw_b = true;
  band.band_s_x = 0.1;
  band.band_s_y = 1e-10;
  band.area = 12.0;
  band.volume = std::numeric_limits<double>::quiet_NaN();
  band.density = std::numeric_limits<double>::infinity();
  band.rf = -std::numeric_limits<double>::infinity();
  band.wm = 1e-10;
  band.r_quantity = 1e21;
  band.a_quantity = -2.5;
  band.lane_bg_density_norm = 1.0 / 3.0;
  band.uid = "B";
  lane.bands.push_back(band);
  frame.lanes.push_back(lane);
  frame.lanes.push_back(CloudLane());
  CloudFrameLanes bare;
  bare.roi.uid = "empty";

  const std::string expected = R"({
    "frameLanesBands": [
        {
            "roi": {
                "x1": 1,
                "y1": 2,
                "x2": 300,
                "y2": 4294967295,
                "x3": 0,
                "y3": 0,
                "x4": 0,
                "y4": 0,
                "sensitivity": [
                    {
                        "channel": 1,
                        "value": 5
                    }
                ],
                "uid": "a\"b\\c/",
                "annotateText": "line\nnext\u0001\t)"
                               "\xc3\xa9"
                               R"("
            },
            "lanes": [
                {
                    "lane": {
                        "x1": 7,
                        "y1": 0,
                        "x2": 0,
                        "y2": 0,
                        "width": 30,
                        "num_bands": 1,
                        "lane_s": 0.25,
                        "mw": true,
                        "update_flag": false,
                        "uid": "L",
                        "annotateText": "",
                        "norm_factor": 1.0,
                        "lane_volume": 123456789.125,
                        "lane_background_volume": 0.0,
                        "lane_adjusted_volume": 0.0
                    },
                    "bands": [
                        {
                            "channel": 2,
                            "x1": 0,
                            "y1": 0,
                            "x2": 0,
                            "y2": 9,
                            "mw_b": true,
                            "band_s_x": 0.1,
                            "band_s_x_raw": 0.0,
                            "band_s_y": 1e-10,
                            "volume": NaN,
                            "area": 12.0,
                            "density": Infinity,
                            "median_intensity": 0.0,
                            "rf": -Infinity,
                            "purity_band": 0.0,
                            "purity_lane": 0.0,
                            "local_bg_volume": 0.0,
                            "local_bg_density": 0.0,
                            "global_bg_volume": 0.0,
                            "global_bg_density": 0.0,
                            "rolling_bg_volume": 0.0,
                            "rolling_bg_density": 0.0,
                            "lane_bg_volume": 0.0,
                            "lane_bg_density": 0.0,
                            "wm": 1e-10,
                            "r_quantity": 1e21,
                            "a_quantity": -2.5,
                            "volume_norm": 0.0,
                            "density_norm": 0.0,
                            "local_bg_volume_norm": 0.0,
                            "local_bg_density_norm": 0.0,
                            "global_bg_volume_norm": 0.0,
                            "global_bg_density_norm": 0.0,
                            "rolling_bg_volume_norm": 0.0,
                            "rolling_bg_density_norm": 0.0,
                            "lane_bg_volume_norm": 0.0,
                            "lane_bg_density_norm": 0.3333333333333333,
                            "uid": "B",
                            "annotateText": ""
                        }
                    ]
                },
                {
                    "lane": {
                        "x1": 0,
                        "y1": 0,
                        "x2": 0,
                        "y2": 0,
                        "width": 0,
                        "num_bands": 0,
                        "lane_s": 0.0,
                        "mw": false,
                        "update_flag": false,
                        "uid": "",
                        "annotateText": "",
                        "norm_factor": 0.0,
                        "lane_volume": 0.0,
                        "lane_background_volume": 0.0,
                        "lane_adjusted_volume": 0.0
                    },
                    "bands": []
                }
            ]
        },
        {
            "roi": {
                "x1": 0,
                "y1": 0,
                "x2": 0,
                "y2": 0,
                "x3": 0,
                "y3": 0,
                "x4": 0,
                "y4": 0,
                "sensitivity": [],
                "uid": "empty",
                "annotateText": ""
            },
            "lanes": []
        }
    ]
})";
  EXPECT_EQ(encodeFrames({frame, bare}), expected);
}

TEST(EncodeRegions, ByteForByte) {
  CloudRegion r;
  r.channel = 1;
  r.circle_b = true;
  r.x = 30;
  r.y = 40;
  r.circle_radius = 5;
  r.volume = 1234.5;
  r.area = 81.0;
  r.density = 15.24074074074074;
  r.purity = 1.0;
  r.uid = "R";
  r.name = "spot";
  r.refName = "ref";
  r.backgroundCorrected = true;
  r.bgColor = "#ff0000";
  const std::string expected = R"({
    "cloud_region_list": [
        {
            "channel": 1,
            "circle_b": true,
            "x1": 0,
            "y1": 0,
            "x2": 0,
            "y2": 0,
            "x": 30,
            "y": 40,
            "circle_radius": 5,
            "volume": 1234.5,
            "area": 81.0,
            "density": 15.24074074074074,
            "median_intensity": 0.0,
            "purity": 1.0,
            "local_bg_volume": 0.0,
            "local_bg_density": 0.0,
            "global_bg_volume": 0.0,
            "global_bg_density": 0.0,
            "rolling_bg_volume": 0.0,
            "rolling_bg_density": 0.0,
            "r_quantity": 0.0,
            "a_quantity": 0.0,
            "uid": "R",
            "name": "spot",
            "refName": "ref",
            "backgroundCorrected": true,
            "bgColor": "#ff0000"
        }
    ]
})";
  EXPECT_EQ(encodeRegions({r}), expected);
}

TEST(BuildFrameLanes, PairsFramesWithTheirLaneLists) {
  std::vector<CloudFrame> frames(3);
  frames[1].uid = "second";
  std::vector<std::vector<CloudLane>> lanes(2);
  lanes[1].resize(2);
  lanes[1][1].uid = "lane";
  const auto built = buildFrameLanes(frames, lanes);
  ASSERT_EQ(built.size(), 3u);
  EXPECT_TRUE(built[0].lanes.empty());
  EXPECT_EQ(built[1].roi.uid, "second");
  ASSERT_EQ(built[1].lanes.size(), 2u);
  EXPECT_EQ(built[1].lanes[1].uid, "lane");
  // A frame without a lane list answers no lanes.
  EXPECT_TRUE(built[2].lanes.empty());
}

}  // namespace
}  // namespace api
}  // namespace viraduve
