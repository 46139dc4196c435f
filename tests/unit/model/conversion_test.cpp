#include <gtest/gtest.h>

#include <cmath>
#include <limits>
#include <string>
#include <vector>

#include "model/conversion.h"
#include "test_support.h"

namespace viraduve {
namespace {

const double kNaN = std::numeric_limits<double>::quiet_NaN();

Lane2D laneWithBands(int x, int bands) {
  Lane2D lane;
  lane.x1 = x;
  lane.x2 = x + 1;
  lane.y2 = 100;
  lane.width = 20;
  lane.num_bands = bands;
  lane.lane_s = 7.5;
  for (int k = 0; k < bands; ++k) {
    Band2D b;
    b.x1 = x - 10;
    b.y1 = 10 * k;
    b.wm = 1.0;
    b.band_s_y = 1.0;
    b.r_quantity = 1.0;
    b.global_bg_density_norm = 1.0;
    lane.bands.push_back(b);
  }
  return lane;
}

TEST(Instrument2Cloud, NewFramesAndLanesAreAppended) {
  // One requested frame without lanes; the detection found two frames of three lanes.
  std::vector<CloudFrame> frames(1);
  frames[0].uid = "F";
  frames[0].x3 = 77;
  frames[0].sensitivity.push_back({0, 3});
  std::vector<std::vector<CloudLane>> lanes;
  std::vector<ROI> rois{{1, 2, 3, 4}, {-1, 20, 30, 40}};
  std::vector<std::vector<Lane2D>> found{{laneWithBands(10, 1), laneWithBands(20, 0),
                                          laneWithBands(30, 2)},
                                         {laneWithBands(40, 0), laneWithBands(50, 0),
                                          laneWithBands(60, 0)}};
  test::StdoutCapture out;
  instrument2cloudAnalysisObject(frames, lanes, rois, found);
  EXPECT_EQ(out.finish(), "In instrument2cloudAnalysisObject\nband lane done\n");

  ASSERT_EQ(frames.size(), 2u);
  EXPECT_EQ(frames[0].uid, "F");
  EXPECT_EQ(frames[0].x3, 77u);
  EXPECT_EQ(frames[0].sensitivity.size(), 1u);
  EXPECT_EQ(frames[0].x2, 3u);
  EXPECT_TRUE(frames[1].uid.empty());
  EXPECT_EQ(frames[1].x1, 4294967295u);  // bit for bit
  EXPECT_EQ(frames[1].y2, 40u);
  ASSERT_EQ(lanes.size(), 2u);
  ASSERT_EQ(lanes[0].size(), 3u);
  ASSERT_EQ(lanes[1].size(), 3u);
  EXPECT_EQ(lanes[0][2].x1, 30u);
  EXPECT_EQ(lanes[0][2].num_bands, 2u);
  EXPECT_EQ(lanes[0][2].bands.size(), 2u);
  EXPECT_EQ(lanes[1][2].x1, 60u);
  // The lane score is never taken from the results.
  EXPECT_EQ(lanes[0][0].lane_s, 0.0);
}

TEST(Instrument2Cloud, MergesByPositionAndNeverShrinks) {
  std::vector<CloudFrame> frames(2);
  frames[1].uid = "kept frame";
  std::vector<std::vector<CloudLane>> lanes(1);
  CloudLane requested;
  requested.uid = "lane uid";
  requested.annotateText = "note";
  requested.lane_s = 3.25;
  requested.norm_factor = 0.5;
  requested.lane_volume = 9.0;
  for (int k = 0; k < 5; ++k) {
    CloudBand b;
    b.uid = "b" + std::to_string(k);
    b.y1 = 100 + k;
    b.band_s_x_raw = 0.75;
    b.annotateText = "t";
    requested.bands.push_back(b);
  }
  lanes[0].push_back(requested);
  CloudLane extraLane;
  extraLane.uid = "second lane";
  lanes[0].push_back(extraLane);

  std::vector<std::vector<Lane2D>> updated{{laneWithBands(10, 3)}};
  instrument2cloudAnalysisObject(frames, lanes, {}, updated);

  ASSERT_EQ(frames.size(), 2u);
  EXPECT_EQ(frames[1].uid, "kept frame");
  ASSERT_EQ(lanes[0].size(), 2u);
  const CloudLane& lane = lanes[0][0];
  EXPECT_EQ(lane.uid, "lane uid");
  EXPECT_EQ(lane.annotateText, "note");
  EXPECT_EQ(lane.lane_s, 3.25);
  EXPECT_EQ(lane.norm_factor, 0.5);
  EXPECT_EQ(lane.lane_volume, 9.0);
  EXPECT_EQ(lane.width, 20u);
  ASSERT_EQ(lane.bands.size(), 5u);
  for (int k = 0; k < 3; ++k) {
    EXPECT_EQ(lane.bands[k].y1, static_cast<uint32_t>(10 * k));
    EXPECT_EQ(lane.bands[k].uid, "b" + std::to_string(k));
    EXPECT_EQ(lane.bands[k].band_s_x_raw, 0.75);
    EXPECT_EQ(lane.bands[k].annotateText, "t");
  }
  // Bands 4 and 5 of the request are answered as they came.
  EXPECT_EQ(lane.bands[3].y1, 103u);
  EXPECT_EQ(lane.bands[4].y1, 104u);
  EXPECT_EQ(lanes[0][1].uid, "second lane");
}

TEST(MergeBand, FloorsAndNaNRules) {
  const struct {
    double Band2D::*from;
    double CloudBand::*to;
    double in;
    double out;  // NaN: stays NaN
  } cases[] = {
      {&Band2D::wm, &CloudBand::wm, 0.0, 1e-10},
      {&Band2D::wm, &CloudBand::wm, 2.5, 2.5},
      {&Band2D::wm, &CloudBand::wm, kNaN, kNaN},
      {&Band2D::band_s_y, &CloudBand::band_s_y, -3.0, 1e-10},
      {&Band2D::r_quantity, &CloudBand::r_quantity, 1e-12, 1e-10},
      {&Band2D::global_bg_density_norm, &CloudBand::global_bg_density_norm, -1.0, 1e-10},
      {&Band2D::global_bg_density_norm, &CloudBand::global_bg_density_norm, kNaN, kNaN},
      {&Band2D::density, &CloudBand::density, kNaN, 0.0},
      {&Band2D::density, &CloudBand::density, -4.0, -4.0},
      {&Band2D::local_bg_density, &CloudBand::local_bg_density, kNaN, 0.0},
      {&Band2D::global_bg_density, &CloudBand::global_bg_density, kNaN, 0.0},
      {&Band2D::rolling_bg_density, &CloudBand::rolling_bg_density, kNaN, 0.0},
      {&Band2D::lane_bg_density, &CloudBand::lane_bg_density, kNaN, kNaN},
      {&Band2D::a_quantity, &CloudBand::a_quantity, -1.0, -1.0},
      {&Band2D::volume, &CloudBand::volume, -2.0, -2.0},
      {&Band2D::area, &CloudBand::area, 0.0, 0.0},
      {&Band2D::density_norm, &CloudBand::density_norm, kNaN, kNaN},
  };
  for (const auto& c : cases) {
    Band2D band;
    band.*c.from = c.in;
    CloudBand cloud;
    mergeBand(band, cloud);
    if (std::isnan(c.out)) {
      EXPECT_TRUE(std::isnan(cloud.*c.to)) << c.in;
    } else {
      EXPECT_EQ(cloud.*c.to, c.out) << c.in;
    }
  }
}

TEST(MergeBand, VolumeAndAreaLandInTheirOwnFields) {
  Band2D band;
  band.channel = 3;
  band.x1 = -2;
  band.area = 11.0;
  band.volume = 22.0;
  band.mw_b = true;
  band.band_s_x = 0.5;
  CloudBand cloud;
  cloud.band_s_x_raw = 8.0;
  mergeBand(band, cloud);
  EXPECT_EQ(cloud.channel, 3u);
  EXPECT_EQ(cloud.x1, 4294967294u);
  EXPECT_EQ(cloud.area, 11.0);
  EXPECT_EQ(cloud.volume, 22.0);
  EXPECT_TRUE(cloud.mw_b);
  EXPECT_EQ(cloud.band_s_x, 0.5);
  EXPECT_EQ(cloud.band_s_x_raw, 8.0);
}

TEST(Regions, RoundTripKeepsTextsAndClearsNaNDensities) {
  CloudRegion r;
  r.channel = 2;
  r.circle_b = true;
  r.circle_radius = 9;
  r.uid = "u";
  r.name = "n";
  r.refName = "ref";
  r.bgColor = "#00ff00";
  r.backgroundCorrected = true;
  const std::vector<Region2D> working = toRegion2DList({r, CloudRegion()});
  ASSERT_EQ(working.size(), 2u);
  EXPECT_EQ(working[0].circle_radius, 9u);
  EXPECT_TRUE(working[0].circle_b);

  Region2D measured = working[0];
  measured.volume = 100.0;
  measured.area = 0.0;
  measured.density = kNaN;
  measured.local_bg_density = kNaN;
  measured.global_bg_density = kNaN;
  measured.rolling_bg_density = kNaN;
  measured.purity = 0.5;
  mergeRegion(measured, r);
  EXPECT_EQ(r.volume, 100.0);
  EXPECT_EQ(r.density, 0.0);
  EXPECT_EQ(r.local_bg_density, 0.0);
  EXPECT_EQ(r.global_bg_density, 0.0);
  EXPECT_EQ(r.rolling_bg_density, 0.0);
  EXPECT_EQ(r.purity, 0.5);
  EXPECT_EQ(r.uid, "u");
  EXPECT_EQ(r.name, "n");
  EXPECT_EQ(r.refName, "ref");
  EXPECT_EQ(r.bgColor, "#00ff00");
  EXPECT_TRUE(r.backgroundCorrected);
}

}  // namespace
}  // namespace viraduve
