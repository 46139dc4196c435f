// The rolling-ball lane background: profile, ball, subtraction and the band measures.
#include <gtest/gtest.h>

#include <cmath>

#include "pipeline/CloudAnalysis.h"
#include "test_support.h"

namespace viraduve {
namespace {

using namespace CloudAnalysis;

Lane2D laneAt(int x1, int y1, int x2, int y2, int width) {
  Lane2D l;
  l.x1 = x1, l.y1 = y1, l.x2 = x2, l.y2 = y2, l.width = width;
  return l;
}

TEST(RollBall, Profiles) {
  const struct {
    const char* what;
    std::vector<double> profile;
    int radius;
    std::vector<double> background;
  } cases[] = {
      // Every interior row of a flat profile is a contact; the last row never is.
      {"flat", std::vector<double>(8, 50.0), 30, std::vector<double>(7, 50.0)},
      // The ball under the peak at row 5 holds the sample (4, 0): the background ends at row 4.
      {"last contact early", {0, 0, 0, 0, 0, 50, 0}, 30, {0, 0, 0, 0, 0}},
      {"two samples", {5, 7}, 30, {5}},
      {"no sample", {}, 30, {}},
      // Without radius no segment is near enough to touch the ball.
      {"radius 0", {3, 90, 1, 50, 2}, 0, {3, 90, 1, 50}},
      // Contacts at rows 2 (0) and 5 (10): the gap is the line between them to two decimals.
      {"rounded gap", {0, 0, 0, 90, 90, 10, 10, 10, 10}, 2, {0, 0, 0, 3.33, 6.67, 10, 10, 10}},
      // Contacts at rows 0 and 4: the line 22.5, 45, 67.5 is cut to the profile at row 2.
      {"gap under the profile", {0, 30, 20, 80, 90, 30}, 3, {0, 22.5, 20, 67.5, 90}},
  };
  for (const auto& c : cases) {
    const std::vector<double> got = rollBall(c.profile, c.radius);
    ASSERT_EQ(got.size(), c.background.size()) << c.what;
    for (std::size_t i = 0; i < got.size(); ++i) EXPECT_NEAR(got[i], c.background[i], 1e-12) << c.what;
  }
}

TEST(LaneProfile, MeanOfTheStripToTwoDecimalsClippedToTheImage) {
  cv::Mat E(9, 20, CV_8UC1, cv::Scalar(6));
  E.at<uchar>(1, 8) = 7;    // width 6 reads columns cx - 2 .. cx + 3: 37 / 6 = 6.1667
  E.at<uchar>(1, 9) = 200;  // just outside
  cv::Mat ramp(9, 20, CV_8UC1);
  for (int x = 0; x < 20; ++x) ramp.col(x).setTo(x * 10);
  const struct {
    const char* what;
    const cv::Mat* image;
    Lane2D lane;
    std::vector<double> profile;
  } cases[] = {
      {"strip", &E, laneAt(5, 0, 5, 1, 6), {6, 6.17}},
      // Width 1 reads the centre alone; centre 0.5 y + 4 rounds half away from zero.
      {"tilted", &ramp, laneAt(4, 0, 8, 8, 1), {40, 50, 50, 60, 60, 70, 70, 80, 80}},
      // Missing pixels count as nothing; the divisor stays the nominal width.
      {"left border", &E, laneAt(1, 0, 1, 0, 6), {5}},
      {"right border", &E, laneAt(18, 0, 18, 0, 6), {4}},
      {"rows outside", &E, laneAt(5, -2, 5, 0, 6), {0, 0, 6}},
      {"no height: vertical at x1", &E, laneAt(1, 2, 15, 2, 6), {5}},
      {"upside down", &E, laneAt(5, 3, 5, 1, 6), {}},
  };
  for (const auto& c : cases) {
    EXPECT_EQ(computeLaneProfile(*c.image, c.lane), c.profile) << c.what;
  }
}

TEST(SubtractLaneBackground, TruncatesClampsAndStopsWithTheBackground) {
  cv::Mat R(10, 12, CV_8UC1, cv::Scalar(100));
  R.at<uchar>(6, 5) = 250;
  // Width 4: columns 4..7; rows 2..7 with background for rows 2..6 only.
  subtractLaneBackground(R, laneAt(5, 2, 5, 7, 4), {10.9, 20.5, 300, -5, -10});
  const int column[] = {100, 100, 89, 79, 0, 105, 110, 100, 100, 100};
  for (int y = 0; y < 10; ++y) {
    EXPECT_EQ(R.at<uchar>(y, 4), column[y]) << y;
    EXPECT_EQ(R.at<uchar>(y, 7), column[y]) << y;
    EXPECT_EQ(R.at<uchar>(y, 3), 100) << y;
    EXPECT_EQ(R.at<uchar>(y, 8), 100) << y;
  }
  EXPECT_EQ(R.at<uchar>(6, 5), 255);

  // Overlapping strips subtract twice; strips across both borders are clipped.
  cv::Mat S(3, 10, CV_8UC1, cv::Scalar(50));
  subtractLaneBackground(S, laneAt(3, 0, 3, 2, 4), {10, 10, 10});  // columns 2..5
  subtractLaneBackground(S, laneAt(5, 0, 5, 2, 4), {10, 10, 10});  // 4..7
  subtractLaneBackground(S, laneAt(0, 0, 0, 2, 8), {1, 1, 1});     // -3..4
  subtractLaneBackground(S, laneAt(9, 0, 9, 2, 8), {2, 2, 2});     // 6..13
  const int row[] = {49, 49, 39, 39, 29, 30, 38, 38, 48, 48};
  for (int x = 0; x < 10; ++x) EXPECT_EQ(S.at<uchar>(1, x), row[x]) << x;
}

Band2D bandAt(uint32_t channel, int x1, int y1, int x2, int y2) {
  Band2D b;
  b.channel = channel, b.x1 = x1, b.y1 = y1, b.x2 = x2, b.y2 = y2;
  return b;
}

Image imageOf(const cv::Mat& m) {
  Image image;
  image.setMat(m);
  return image;
}

TEST(RollingBallMeasures, RawVolumesRollingFromTheSubtractedLaneAndPurities) {
  // 16-bit 20 * 256 over the left half, 0 over the right. The first lane's profile is flat, so
  // its background equals it on rows 0..28; the last row (29) keeps its value.
  cv::Mat m = cv::Mat::zeros(30, 40, CV_16UC1);
  m.colRange(0, 20).setTo(20 * 256);
  std::vector<Lane2D> lanes = {laneAt(10, 0, 10, 29, 6), laneAt(30, 0, 30, 29, 6)};
  lanes[0].bands = {bandAt(0, 8, 5, 12, 10), bandAt(0, 8, 28, 12, 29), bandAt(1, 8, 5, 12, 10)};
  lanes[1].bands = {bandAt(0, 28, 5, 32, 10)};
  lanes[0].bands[2].volume = 123;
  analyseLanesWithRollingBall(imageOf(m), lanes, 0, ROI{0, 0, 19, 29}, 30);

  const Band2D& b = lanes[0].bands[0];
  EXPECT_EQ(b.volume, 30.0 * 5120);  // the decoded values, not rescaled
  EXPECT_EQ(b.global_bg_volume, 0.0);  // from the frame (the whole image's would be 0)
  EXPECT_EQ(b.rolling_bg_volume, 0.0);
  EXPECT_NEAR(b.rf, 7.0f / 29.0f, 1e-7);
  EXPECT_EQ(lanes[0].bands[1].rolling_bg_volume, 5.0 * 5120);  // row 29, back in 16-bit units
  EXPECT_EQ(b.purity_band, 0.0);
  EXPECT_EQ(lanes[0].bands[1].purity_band, 1.0);
  EXPECT_EQ(lanes[0].bands[2].volume, 123.0);  // another channel
  // The second lane lies on zeros: no rolling volume and no lane volume to divide by.
  EXPECT_EQ(lanes[1].bands[0].purity_band, -1.0);
  EXPECT_EQ(lanes[1].bands[0].purity_lane, -1.0);
}

TEST(RollingBallMeasures, RadiusPerChannelLastPairWinsOthersThirty) {
  cv::Mat m(80, 30, CV_16UC1);
  for (int y = 0; y < 80; ++y) {
    m.row(y).setTo(static_cast<int>((20 + 150 * std::exp(-(y - 40) * (y - 40) / 200.0) + (y % 7) * 3) * 256));
  }
  test::TempDir dir;
  test::writeImage(dir.file("ch0.tif"), m);
  test::writeImage(dir.file("ch1.tif"), m);
  std::vector<Lane2D> lanes = {laneAt(15, 0, 15, 79, 8)};
  lanes[0].bands = {bandAt(0, 12, 30, 18, 50), bandAt(1, 12, 30, 18, 50)};
  const ROI frame{0, 0, 29, 79};
  auto direct = [&](uint32_t channel, uint32_t radius) {
    std::vector<Lane2D> l = lanes;
    analyseLanesWithRollingBall(imageOf(m), l, channel, frame, radius);
    return l[0].bands[channel].rolling_bg_volume;
  };
  ASSERT_NE(direct(1, 10), direct(1, 20));
  ASSERT_NE(direct(0, 20), direct(0, 30));

  std::vector<std::vector<Lane2D>> frames = {lanes};
  runRollingBallAnalysis(dir.path(), frames, std::vector<ImageParam>(2), ImageMode_Universal,
                         frame, {{1, 10}, {1, 20}});
  EXPECT_EQ(frames[0][0].bands[0].rolling_bg_volume, direct(0, 30));
  EXPECT_EQ(frames[0][0].bands[1].rolling_bg_volume, direct(1, 20));
}

}  // namespace
}  // namespace viraduve
