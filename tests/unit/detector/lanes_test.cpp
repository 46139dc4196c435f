// Lane candidates, the line fit through a lane's bands, and the spacing regularisation.
#include <gtest/gtest.h>

#include <cmath>
#include <string>
#include <vector>

#include "detector/BandLaneDetectionImpl.h"
#include "quiet.h"

namespace viraduve {
namespace {

Lane2D verticalLane(int x, int y1 = 0, int y2 = 499) {
  Lane2D lane;
  lane.x1 = lane.x2 = x;
  lane.y1 = y1;
  lane.y2 = y2;
  return lane;
}

std::vector<int> centresOf(const std::vector<Lane2D>& lanes) {
  std::vector<int> x;
  for (const Lane2D& lane : lanes) x.push_back((lane.x1 + lane.x2) / 2);
  return x;
}

// refineLanesNew with the median spacing W = 100 in every case.
TEST(RefineLanes, GapsAreFilledAndCrowdingLanesDropped) {
  const struct {
    const char* name;
    std::vector<int> centres;
    int cols;
    std::vector<int> expected;
  } cases[] = {
      // Gap 260 left of lane 2: r = 2.6, m = 2, s = 260 / 3 = 86 -> lanes at -172 and -86.
      {"gap of 260", {100, 200, 460, 560, 660}, 860, {100, 200, 288, 374, 460, 560, 660}},
      // Gap 200: r = 2, m = 1, the lane goes to the midpoint.
      {"gap of 200", {100, 200, 300, 500, 600}, 700, {100, 200, 300, 400, 500, 600}},
      // Right margin (cols - 1) - 660: 199 / 100 = 1 gives nothing, 200 / 100 = 2 one lane.
      {"right margin 199", {60, 160, 260, 360, 460, 560, 660}, 860,
       {60, 160, 260, 360, 460, 560, 660}},
      {"right margin 200", {60, 160, 260, 360, 460, 560, 660}, 861,
       {60, 160, 260, 360, 460, 560, 660, 760}},
      // Lane 0 is measured from the frame's left edge: 260 -> two lanes W apart.
      {"left margin 260", {260, 360, 460}, 500, {60, 160, 260, 360, 460}},
      // 25 right of its neighbour (r = 0.25): dropped; the next lane keeps its own gap 75.
      {"crowding lane", {100, 200, 300, 325, 400, 500}, 560, {100, 200, 300, 400, 500}},
      // The first lane is never dropped, however close to the edge.
      {"first lane near the edge", {10, 110, 210}, 260, {10, 110, 210}},
  };
  for (const auto& c : cases) {
    BandLaneDetectionImpl detector;
    detector.normed_image_ = cv::Mat_<float>::zeros(10, c.cols);
    detector.band_width_ = 17;
    std::vector<Lane2D> in;
    for (int x : c.centres) {
      Lane2D lane = verticalLane(x, 3, 480);
      lane.lane_s = 0.75;
      lane.bands = {Band2D{}};
      in.push_back(lane);
    }
    in[0].num_bands = 4;
    std::vector<Lane2D> out;
    test::logOf([&] { detector.refineLanesNew(in, out); });
    EXPECT_EQ(centresOf(out), c.expected) << c.name;
    for (const Lane2D& lane : out) {
      const bool inserted = lane.bands.empty();
      if (!inserted) continue;
      EXPECT_EQ(lane.width, 17) << c.name;
      EXPECT_EQ(lane.y1, 3) << c.name;
      EXPECT_EQ(lane.y2, 480) << c.name;
      EXPECT_EQ(lane.num_bands, 4) << c.name;
      EXPECT_EQ(lane.lane_s, 0.75) << c.name;
    }
  }
}

TEST(RefineLanes, LanesOnTopOfEachOtherInsertNothing) {
  // A median spacing of 0 gives no gap measure; nothing may be inserted.
  BandLaneDetectionImpl detector;
  detector.normed_image_ = cv::Mat_<float>::zeros(10, 400);
  const std::vector<Lane2D> in = {verticalLane(300), verticalLane(300), verticalLane(300)};
  std::vector<Lane2D> out;
  test::logOf([&] { detector.refineLanesNew(in, out); });
  EXPECT_EQ(centresOf(out), (std::vector<int>{300, 300, 300}));
}

Band2D bandAt(double cx, int cy, int halfWidth = 10, int halfHeight = 4) {
  Band2D band;
  band.x1 = static_cast<int>(std::lround(cx)) - halfWidth;
  band.x2 = static_cast<int>(std::lround(cx)) + halfWidth;
  band.y1 = cy - halfHeight;
  band.y2 = cy + halfHeight;
  band.band_s_y = 0.5;
  band.lane_bg_volume = 0.5;
  return band;
}

// A lane whose bands lie on a line tilted from vertical follows that line up to 5 degrees;
// beyond, it is made vertical through the mean band centre.
TEST(FitLaneBasedBands, TiltWithinFiveDegreesIsFollowed) {
  const struct {
    double degrees;
    bool follows;
  } cases[] = {{0.0, true}, {4.0, true}, {-4.0, true}, {6.0, false}, {-6.0, false}};
  for (const auto& c : cases) {
    const double k = std::tan(c.degrees * CV_PI / 180.0);
    Lane2D lane = verticalLane(200, 0, 399);
    double meanX = 0.0;
    for (int y = 40; y <= 360; y += 80) {
      lane.bands.push_back(bandAt(200 + (y - 200) * k, y));
      meanX += std::lround(200 + (y - 200) * k);
    }
    meanX /= 5;
    BandLaneDetectionImpl detector;
    detector.band_width_ = 20;
    Lane2D fitted;
    test::logOf([&] { detector.fitLaneBasedBands(lane, fitted); });
    EXPECT_EQ(fitted.bands.size(), 5u);
    if (c.follows) {
      EXPECT_NEAR(fitted.x1, 200 - 200 * k, 1.0) << c.degrees;
      EXPECT_NEAR(fitted.x2, 200 + 199 * k, 1.0) << c.degrees;
    } else {
      EXPECT_EQ(fitted.x1, fitted.x2) << c.degrees;
      EXPECT_NEAR(fitted.x1, meanX, 1.0) << c.degrees;
    }
    EXPECT_EQ(fitted.y1, 0);
    EXPECT_EQ(fitted.y2, 399);
  }
}

TEST(FitLaneBasedBands, OnlyScoredBandsWithEdgesCount) {
  Lane2D lane = verticalLane(200, 0, 399);
  lane.bands = {bandAt(230, 100), bandAt(180, 200), bandAt(170, 300)};
  lane.bands[0].band_s_y = 0.9;      // the one valid band
  lane.bands[1].band_s_y = 0.01;     // score not above 0.01
  lane.bands[2].lane_bg_volume = 0;  // no edge strength
  BandLaneDetectionImpl detector;
  detector.band_width_ = 20;
  Lane2D fitted;
  test::logOf([&] { detector.fitLaneBasedBands(lane, fitted); });
  ASSERT_EQ(fitted.bands.size(), 1u);
  EXPECT_EQ(fitted.x1, 230);
  EXPECT_EQ(fitted.x2, 230);

  lane.bands[0].band_s_y = 0.0;
  test::logOf([&] { detector.fitLaneBasedBands(lane, fitted); });
  EXPECT_TRUE(fitted.bands.empty());
  EXPECT_EQ(fitted.x1, 200);
}

TEST(LineFittingRansac, OutlierIsLeftOut) {
  const std::vector<cv::Point2f> points = {{100, 10}, {101, 60}, {160, 90}, {100, 110}, {99, 160}};
  BandLaneDetectionImpl detector;
  std::vector<cv::Point2f> inliers;
  cv::Vec4f line;
  test::logOf([&] { detector.lineFittingRansac(points, inliers, line, 5.0); });
  ASSERT_EQ(inliers.size(), 4u);
  EXPECT_EQ(inliers[2], points[3]);
  EXPECT_NEAR(std::fabs(line[1]), 1.0, 1e-3);  // vertical
  EXPECT_NEAR(line[2], 100.0, 0.5);
}

TEST(LineFittingRansac, ZeroThresholdKeepsTheBestPairsLine) {
  // A band width below 4 makes the inlier distance 0: no point supports any line.
  const std::vector<cv::Point2f> points = {{10, 10}, {10, 50}};
  BandLaneDetectionImpl detector;
  std::vector<cv::Point2f> inliers;
  cv::Vec4f line;
  test::logOf([&] { detector.lineFittingRansac(points, inliers, line, 0.0); });
  EXPECT_TRUE(inliers.empty());
  EXPECT_NEAR(std::fabs(line[1]), 1.0, 1e-6);
}

// Profile peaks closer than 0.6 x bw to a lane already taken, or to the frame's edges, are
// not lanes; the left one of two close peaks wins.
TEST(InitialDetectLanes, CandidatesKeepTheirDistance) {
  const struct {
    const char* name;
    std::vector<int> bars;
    std::vector<int> expected;
  } cases[] = {
      {"far apart", {60, 140}, {60, 140}},
      {"closer than 0.6 bw", {60, 71, 140}, {60, 140}},
      {"next to the left edge", {8, 60}, {60}},
  };
  for (const auto& c : cases) {
    cv::Mat_<float> img = cv::Mat_<float>::zeros(200, 200);
    // Short bands, each in its own rows, make one column-profile peak each.
    int row = 20;
    for (int x : c.bars) {
      img(cv::Rect(x - 4, row, 9, 10)) = 1.0f;
      row += 50;
    }
    BandLaneDetectionImpl detector;
    detector.image_ = img;
    detector.normed_image_ = img;
    detector.band_width_ = 20;
    std::vector<Lane2D> lanes;
    const std::string log = test::logOf([&] { detector.initialDetectLanes(lanes); });
    // Every bar is a profile peak; the spacing test alone removes the extra ones.
    EXPECT_NE(log.find("lanes_ini.size() = " + std::to_string(c.bars.size())),
              std::string::npos)
        << c.name;
    std::vector<int> x;
    for (const Lane2D& lane : lanes) x.push_back(lane.x1);
    EXPECT_EQ(x.size(), c.expected.size()) << c.name;
    for (std::size_t i = 0; i < x.size() && i < c.expected.size(); ++i)
      EXPECT_NEAR(x[i], c.expected[i], 2) << c.name;
    for (const Lane2D& lane : lanes) {
      EXPECT_EQ(lane.y1, 0);
      EXPECT_EQ(lane.y2, 199);
      EXPECT_EQ(lane.width, 20);
    }
  }
}

}  // namespace
}  // namespace viraduve
