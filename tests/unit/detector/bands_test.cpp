// Band width estimate, the two stages of band finding in one lane, and the side-edge score.
#include <gtest/gtest.h>

#include <cmath>
#include <string>
#include <vector>

#include <opencv2/imgproc.hpp>

#include "detector/BandLaneDetectionImpl.h"
#include "detector/detector_helpers.h"
#include "quiet.h"

namespace viraduve {
namespace {

TEST(IntegerMedian, EvenCountsHalveTheMiddleSumInIntegerDivision) {
  EXPECT_EQ(integerMedian({20, 22, 30, 31}), 26);  // (22 + 30) / 2
  EXPECT_EQ(integerMedian({31, 20, 30}), 30);
  EXPECT_EQ(integerMedian({5, 6}), 5);              // 11 / 2
  EXPECT_EQ(integerMedian({}), 0);
}

// Gradient images built by hand: horizontal edge lines 3 rows thick (they survive the 3 x 3
// erosion as one row) and vertical side-edge lines over all rows.
class LaneStrip : public ::testing::Test {
 protected:
  static constexpr int kRows = 200;
  static constexpr int kCols = 100;
  static constexpr int kCentre = 50;

  void SetUp() override {
    det_.image_ = cv::Mat_<float>::zeros(kRows, kCols);
    det_.grad_y_1 = cv::Mat_<float>::zeros(kRows, kCols);
    det_.grad_y_2 = cv::Mat_<float>::zeros(kRows, kCols);
    det_.grad_x_1 = cv::Mat_<float>::zeros(kRows, kCols);
    det_.grad_x_2 = cv::Mat_<float>::zeros(kRows, kCols);
    det_.band_width_ = 20;
  }
  void topEdge(int row) { det_.grad_y_1(cv::Range(row - 1, row + 2), cv::Range(30, 71)) = 1.0f; }
  void bottomEdge(int row) {
    det_.grad_y_2(cv::Range(row - 1, row + 2), cv::Range(30, 71)) = 1.0f;
  }
  void leftEdge(int col) { det_.grad_x_1.col(col) = 1.0f; }
  void rightEdge(int col) { det_.grad_x_2.col(col) = 1.0f; }

  std::vector<Band2D> find() {
    Lane2D lane;
    lane.x1 = lane.x2 = kCentre;
    lane.y2 = kRows - 1;
    std::vector<Band2D> bands;
    test::logOf([&] { det_.initialFindBandsInOneLane(lane, bands); });
    return bands;
  }

  BandLaneDetectionImpl det_;
};

TEST_F(LaneStrip, ConsecutiveTopAndBottomEdgesMakeBands) {
  leftEdge(40);
  rightEdge(60);
  const struct {
    const char* name;
    std::vector<int> tops, bottoms;
    std::vector<std::pair<int, int>> rows;
  } cases[] = {
      {"top bottom top bottom", {50, 120}, {70, 140}, {{50, 70}, {120, 140}}},
      {"top top bottom", {50, 80}, {100}, {{80, 100}}},
      {"bottom before top", {100}, {80}, {}},
      {"taller than a quarter of the frame", {40}, {95}, {}},
      {"centre within rows / 20 of the top", {4}, {14}, {}},
      {"centre just below rows / 20", {8}, {20}, {{8, 20}}},
  };
  for (const auto& c : cases) {
    SetUp();
    leftEdge(40);
    rightEdge(60);
    for (int t : c.tops) topEdge(t);
    for (int b : c.bottoms) bottomEdge(b);
    const std::vector<Band2D> bands = find();
    ASSERT_EQ(bands.size(), c.rows.size()) << c.name;
    for (std::size_t i = 0; i < bands.size(); ++i) {
      EXPECT_EQ(bands[i].y1, c.rows[i].first) << c.name;
      EXPECT_EQ(bands[i].y2, c.rows[i].second) << c.name;
      EXPECT_EQ(bands[i].x1, 40) << c.name;
      EXPECT_EQ(bands[i].x2, 60) << c.name;
      EXPECT_GT(bands[i].band_s_y, 0.05) << c.name;
      EXPECT_GT(bands[i].lane_bg_volume, 0.0) << c.name;
    }
  }
}

TEST_F(LaneStrip, SideEdgesDecideWhetherABandStays) {
  const struct {
    const char* name;
    std::vector<int> lefts, rights;
    int x1;  // -1: the band is dropped
  } cases[] = {
      {"one pair", {40}, {60}, 40},
      {"no side edges", {}, {}, -1},
      // Pairs 37-63 and 43-63 score within a factor 1.2 of each other: ambiguous.
      {"two similar pairs", {37, 43}, {63}, -1},
      // 31-60 scores far below 40-60: the better pair wins.
      {"one clearly better pair", {31, 40}, {60}, 40},
      {"pair far wider than the band", {28}, {72}, -1},
  };
  for (const auto& c : cases) {
    SetUp();
    topEdge(90);
    bottomEdge(110);
    for (int l : c.lefts) leftEdge(l);
    for (int r : c.rights) rightEdge(r);
    const std::vector<Band2D> bands = find();
    if (c.x1 < 0) {
      EXPECT_TRUE(bands.empty()) << c.name;
    } else {
      ASSERT_EQ(bands.size(), 1u) << c.name;
      EXPECT_EQ(bands[0].x1, c.x1) << c.name;
    }
  }
}

TEST_F(LaneStrip, LaneTooNarrowForAStripHasNoBands) {
  topEdge(90);
  bottomEdge(110);
  leftEdge(40);
  rightEdge(60);
  det_.band_width_ = 4;  // trunc(4 x 0.2) = 0: the strip has one column
  EXPECT_TRUE(find().empty());
}

TEST(ScoreEdgePair, LimitsOnWidthCentreBalanceAndStrength) {
  // bw = 20, expected centre 24.
  const struct {
    const char* name;
    int l, r;
    double vl, vr, m;
    bool scores;
  } cases[] = {
      {"width 40 > 1.7 bw", 4, 44, 0.5, 0.5, 0.5, false},
      {"width 12 >= 0.58 bw", 18, 30, 0.5, 0.5, 0.5, true},
      {"width 11 < 0.58 bw", 19, 30, 0.5, 0.5, 0.5, false},
      {"centre left of the pair", 24, 44, 0.5, 0.5, 0.5, false},
      {"sides 0.3 : 1", 14, 34, 1.0, 0.3, 0.5, false},
      {"sides 0.34 : 1", 14, 34, 1.0, 0.34, 0.5, true},
      {"sides weak against top and bottom", 14, 34, 0.04, 0.04, 1.0, false},
      {"right before left", 34, 14, 0.5, 0.5, 0.5, false},
      {"no side strength", 14, 34, 0.0, 0.0, 0.0, false},
  };
  for (const auto& c : cases) {
    EdgePair pair{c.l, c.r, c.vl, c.vr, c.m, 24, 20.0f, -1.0f};
    BandLaneDetectionImpl::scoreEdgePair(pair);
    EXPECT_EQ(pair.score > 0, c.scores) << c.name;
    EXPECT_GE(pair.score, 0.0f) << c.name;
  }
}

TEST(ScoreEdgePair, Value) {
  EdgePair ideal{14, 34, 0.5, 0.5, 0.5, 24, 20.0f, 0.0f};
  BandLaneDetectionImpl::scoreEdgePair(ideal);
  EXPECT_FLOAT_EQ(ideal.score, 1.0f);  // every factor at its best, times vl + vr = 1

  EdgePair off{14, 36, 0.5, 0.5, 0.25, 24, 20.0f, 0.0f};
  BandLaneDetectionImpl::scoreEdgePair(off);
  const double expected =
      std::exp(-2.0 / 16.0) * (1.0 - 0.25 / 0.75) * 1.0 * std::exp(-1.0 / 10.0);
  EXPECT_FLOAT_EQ(off.score, static_cast<float>(expected));
}

TEST(ComputeBandWidth, MedianOfBandLikeContours) {
  BandLaneDetectionImpl detector;
  cv::Mat_<float> img = cv::Mat_<float>::zeros(300, 400);
  // Four bright bands 14 rows tall, 40 px wide, well apart.
  for (int i = 0; i < 4; ++i) img(cv::Rect(40 + 90 * i, 100, 40, 14)) = 0.8f;
  detector.scaled_image_ = img;
  detector.scale_factor_ = 1.0;
  int width = 0;
  test::logOf([&] { detector.computeBandWidth(width); });
  EXPECT_NEAR(width, 40, 4);
}

TEST(ComputeBandWidth, ThinLinesAndEmptyFramesGiveZero) {
  const struct {
    const char* name;
    cv::Mat_<float> image;
    const char* log;
  } cases[] = {
      {"long thin lines", cv::Mat_<float>::zeros(200, 300),
       "No valid contour is detected. band_width is set to 0."},
      {"nothing", cv::Mat_<float>::zeros(200, 300), "contours.size < 1"},
  };
  cases[0].image(cv::Rect(10, 50, 280, 2)) = 1.0f;
  cases[0].image(cv::Rect(10, 120, 280, 2)) = 1.0f;
  for (const auto& c : cases) {
    BandLaneDetectionImpl detector;
    detector.scaled_image_ = c.image;
    int width = 0;
    const std::string log = test::logOf([&] { detector.computeBandWidth(width); });
    EXPECT_EQ(width, 0) << c.name;
    EXPECT_NE(log.find(c.log), std::string::npos) << c.name;
  }
}

}  // namespace
}  // namespace viraduve
