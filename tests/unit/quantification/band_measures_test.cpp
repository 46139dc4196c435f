// Band quantification on small images whose measures can be worked out by hand.
#include <gtest/gtest.h>

#include <cmath>
#include <numeric>
#include <string>
#include <vector>

#include <opencv2/core.hpp>
#include <opencv2/imgproc.hpp>

#include "detector/BandLaneDetectionImpl.h"
#include "test_support.h"
#include "viraduve/Exception.h"

namespace viraduve {
namespace {

Image imageOf(const cv::Mat& m) {
  Image image;
  image.setMat(m);
  return image;
}

Band2D bandAt(uint32_t channel, int x1, int y1, int x2, int y2) {
  Band2D b;
  b.channel = channel;
  b.x1 = x1;
  b.y1 = y1;
  b.x2 = x2;
  b.y2 = y2;
  return b;
}

Lane2D laneAt(int x1, int y1, int x2, int y2, int width) {
  Lane2D l;
  l.x1 = x1;
  l.y1 = y1;
  l.x2 = x2;
  l.y2 = y2;
  l.width = width;
  return l;
}

// The lane sum as written out in full: an image-size mask and a masked copy.
float literalLaneSum(const cv::Mat& A, const Lane2D& lane) {
  cv::Mat M = cv::Mat::zeros(A.size(), CV_8U);
  const cv::Point corners[4] = {{static_cast<int>(lane.x1 - lane.width * 0.5), lane.y1},
                                {static_cast<int>(lane.x1 + lane.width * 0.5), lane.y1},
                                {static_cast<int>(lane.x2 + lane.width * 0.5), lane.y2},
                                {static_cast<int>(lane.x2 - lane.width * 0.5), lane.y2}};
  cv::fillConvexPoly(M, corners, 4, cv::Scalar(255.0), 8, 0);
  cv::Mat AM;
  A.copyTo(AM, M);
  return static_cast<float>(cv::sum(AM)[0]);
}

void expectSameBand(const Band2D& a, const Band2D& b) {
  const double fa[] = {a.band_s_x, a.band_s_y, a.area, a.volume, a.density, a.median_intensity,
                       a.rf, a.purity_band, a.purity_lane, a.local_bg_volume,
                       a.local_bg_density, a.global_bg_volume, a.global_bg_density,
                       a.rolling_bg_volume, a.rolling_bg_density, a.lane_bg_volume, a.wm};
  const double fb[] = {b.band_s_x, b.band_s_y, b.area, b.volume, b.density, b.median_intensity,
                       b.rf, b.purity_band, b.purity_lane, b.local_bg_volume,
                       b.local_bg_density, b.global_bg_volume, b.global_bg_density,
                       b.rolling_bg_volume, b.rolling_bg_density, b.lane_bg_volume, b.wm};
  for (std::size_t i = 0; i < std::size(fa); ++i) EXPECT_EQ(fa[i], fb[i]) << "field " << i;
}

// 40 x 30 image, background 100; the 5-pixel frame around the band box (10..13, 10..11)
// holds 300; the band pixels are 1000..1007 in row order.
cv::Mat bandImage() {
  cv::Mat m(30, 40, CV_16U, cv::Scalar(100));
  m(cv::Rect(5, 5, 14, 12)).setTo(300);
  for (int i = 0; i < 8; ++i) m.at<ushort>(10 + i / 4, 10 + i % 4) = static_cast<ushort>(1000 + i);
  return m;
}

TEST(BandMeasures, HandComputedBand) {
  const cv::Mat raw = bandImage();
  std::vector<Lane2D> lanes{laneAt(7, 0, 16, 29, 11)};  // tilted: 9 columns over 29 rows
  lanes[0].bands.push_back(bandAt(0, 10, 10, 13, 11));
  Band2D other = bandAt(1, 20, 20, 22, 22);
  other.local_bg_volume = 1000.25;
  other.volume = 7.0;
  other.purity_band = -3.0;
  other.wm = 42.0;
  lanes[0].bands.push_back(other);

  BandLaneDetectionImpl detector;
  detector.analyis(imageOf(raw), lanes, 0, ROI{0, 0, 39, 29}, 30);

  const Band2D& b = lanes[0].bands[0];
  EXPECT_EQ(b.area, 8.0);
  EXPECT_EQ(b.volume, 8028.0);  // 1000 + ... + 1007
  EXPECT_EQ(b.density, 1003.5);
  EXPECT_EQ(b.median_intensity, 1004.0);  // upper middle of eight, not their mean 1003.5
  EXPECT_EQ(b.local_bg_volume, 8028.0 - 8 * 300.0);  // frame mean 300
  EXPECT_EQ(b.local_bg_density, (8028.0 - 2400.0) / 8.0);
  // Whole-image background: index 601 of 1200 in descending order is a 100 pixel.
  EXPECT_EQ(b.global_bg_volume, 8028.0 - 800.0);
  EXPECT_EQ(b.global_bg_density, 7228.0 / 8.0);
  // The 61-wide opening spans this whole image, so it is its minimum, 100.
  EXPECT_EQ(b.rolling_bg_volume, 7228.0);
  EXPECT_EQ(b.rolling_bg_density, 7228.0 / 8.0);
  EXPECT_EQ(b.rf, static_cast<double>(10.0f / 29.0f));  // centre row (10 + 11) / 2 = 10

  // Sloc counts the other channel's stored local volume, in single precision.
  const float sloc = static_cast<float>(0.0f + 5628.0) + 1000.25;
  EXPECT_EQ(b.purity_band, 5628.0 / static_cast<double>(sloc));
  cv::Mat A;
  raw.convertTo(A, CV_32F);
  EXPECT_EQ(b.purity_lane, 8028.0 / static_cast<double>(literalLaneSum(A, lanes[0])));

  expectSameBand(lanes[0].bands[1], other);
}

TEST(BandMeasures, LocalFrameIsClippedAtTheImageBorder) {
  cv::Mat raw(30, 40, CV_16U, cv::Scalar(5000));
  raw(cv::Rect(0, 0, 9, 7)).setTo(200);  // the clipped frame: columns 0..8, rows 0..6
  raw(cv::Rect(0, 0, 4, 2)).setTo(1000);
  std::vector<Lane2D> lanes{laneAt(2, 0, 2, 29, 4)};
  lanes[0].bands.push_back(bandAt(0, 0, 0, 3, 1));
  BandLaneDetectionImpl detector;
  detector.analyis(imageOf(raw), lanes, 0, ROI{0, 0, 39, 29}, 30);
  EXPECT_EQ(lanes[0].bands[0].local_bg_volume, 8 * 800.0);
}

TEST(BandMeasures, InvertedBackgroundMeasuresTheComplement) {
  const cv::Mat raw = bandImage();
  std::vector<Lane2D> lanes{laneAt(11, 0, 11, 29, 10)};
  lanes[0].bands.push_back(bandAt(0, 10, 10, 13, 11));
  BandLaneDetectionImpl detector;
  detector.background_ = 1;
  detector.analyis(imageOf(raw), lanes, 0, ROI{0, 0, 39, 29}, 30);
  EXPECT_EQ(lanes[0].bands[0].volume, 8 * 65536.0 - 8028.0);
}

TEST(BandMeasures, RollingBackgroundRemovesBroadStructures) {
  // A 120 x 120 plateau of 500 over 100, with a 3-row band of 900 inside it.
  cv::Mat raw(200, 200, CV_16U, cv::Scalar(100));
  raw(cv::Rect(40, 40, 120, 120)).setTo(500);
  raw(cv::Rect(80, 100, 30, 3)).setTo(900);
  std::vector<Lane2D> lanes{laneAt(95, 40, 95, 159, 30)};
  lanes[0].bands.push_back(bandAt(0, 80, 60, 109, 62));    // plateau only
  lanes[0].bands.push_back(bandAt(0, 80, 100, 109, 102));  // the narrow band
  BandLaneDetectionImpl detector;
  detector.analyis(imageOf(raw), lanes, 0, ROI{0, 0, 199, 199}, 30);
  EXPECT_EQ(lanes[0].bands[0].rolling_bg_volume, 0.0);
  EXPECT_GT(lanes[0].bands[0].global_bg_volume, 0.0);
  EXPECT_EQ(lanes[0].bands[1].rolling_bg_volume, 90 * 400.0);
}

TEST(BandMeasures, RelativeFrontUsesTheIntegerBandCentre) {
  const struct {
    int bandY1, bandY2, laneY1, laneY2;
    float expected;
  } cases[] = {
      {10, 13, 0, 40, 11.0f / 40.0f},  // (10 + 13) / 2 = 11, not 11.5
      {10, 11, 5, 25, 5.0f / 20.0f},
      {3, 3, 3, 10, 0.0f},
      {20, 29, 0, 7, 24.0f / 7.0f},  // below the lane's end: no clamping
  };
  for (const auto& c : cases) {
    cv::Mat raw(40, 20, CV_16U, cv::Scalar(10));
    std::vector<Lane2D> lanes{laneAt(10, c.laneY1, 10, c.laneY2, 6)};
    lanes[0].bands.push_back(bandAt(0, 8, c.bandY1, 12, c.bandY2));
    BandLaneDetectionImpl detector;
    detector.analyis(imageOf(raw), lanes, 0, ROI{0, 0, 19, 39}, 30);
    EXPECT_EQ(lanes[0].bands[0].rf, static_cast<double>(c.expected)) << c.bandY1 << ".." << c.bandY2;
  }
}

TEST(BandMeasures, BoxOutsideTheImageIsAnOpenCvError) {
  cv::Mat raw(30, 40, CV_16U, cv::Scalar(10));
  std::vector<Lane2D> lanes{laneAt(10, 0, 10, 29, 6)};
  lanes[0].bands.push_back(bandAt(0, 35, 10, 40, 12));
  BandLaneDetectionImpl detector;
  EXPECT_THROW(detector.analyis(imageOf(raw), lanes, 0, ROI{0, 0, 39, 29}, 30), cv::Exception);
  EXPECT_THROW(detector.analyis(imageOf(raw), lanes, 0, ROI{0, 0, 40, 29}, 30), cv::Exception);
}

TEST(BandMeasures, EmptyGlobalBackgroundRectangleIsRefused) {
  cv::Mat raw(30, 40, CV_16U, cv::Scalar(10));
  std::vector<Lane2D> lanes;
  BandLaneDetectionImpl detector;
  try {
    detector.analyis(imageOf(raw), lanes, 0, ROI{5, 5, 4, 9}, 30);
    FAIL() << "no exception";
  } catch (const Exception& e) {
    EXPECT_EQ(e.code, -4);
  }
}

TEST(BandMeasures, LogLinesOfTheRectangleForm) {
  const cv::Mat raw = bandImage();
  BandLaneDetectionImpl detector;
  {
    std::vector<Lane2D> none;
    test::StdoutCapture capture;
    detector.analyis(imageOf(raw), none, 2, ROI{0, 0, 19, 9}, 30);
    EXPECT_EQ(capture.finish(),
              "In BandLaneDetectionImpl::analyis().\n"
              "src.rows = 30\nsrc.cols = 40\ngb_roi.rows = 10\ngb_roi.cols = 20\n"
              "channel_= 2\nnumOfLane = 0\n"
              "Out BandLaneDetectionImpl::analyis().\n");
  }
  std::vector<Lane2D> lanes{laneAt(11, 0, 12, 29, 10)};
  lanes[0].bands.push_back(bandAt(1, 10, 10, 13, 11));
  lanes[0].bands.push_back(bandAt(0, 10, 10, 13, 11));
  test::StdoutCapture capture;
  detector.analyis(imageOf(raw), lanes, 0, ROI{0, 0, 39, 29}, 30);
  const std::string log = capture.finish();
  EXPECT_NE(log.find("numOfLane = 1\nlane_0\nx1 = 11, y1 = 0, x2 = 12, y2 = 29, \n"
                     "lanewidth = 10\nnumOfBands = 2\nband_0\nband_1\n"
                     "x1 = 10, y1 = 10, x2 = 13, y2 = 11, \nlocal_bg_volume = 5628\n"
                     "Out BandLaneDetectionImpl::analyis().\n"),
            std::string::npos)
      << log;
}

TEST(BandMeasures, CircleFormMeasuresLikeTheRectangleFormAndLogsOnlyEntryAndExit) {
  const cv::Mat raw = bandImage();
  std::vector<Lane2D> byRect{laneAt(11, 0, 11, 29, 10)};
  byRect[0].bands.push_back(bandAt(0, 10, 10, 13, 11));
  std::vector<Lane2D> byCircle = byRect;
  BandLaneDetectionImpl detector;
  detector.analyis(imageOf(raw), byRect, 0, ROI{0, 0, 39, 29}, 30);
  test::StdoutCapture capture;
  // Radius 1 holds only the centre pixel (30, 25), a background pixel of 100.
  detector.analyis(imageOf(raw), byCircle, 0, Circle{30, 25, 1}, 30);
  EXPECT_EQ(capture.finish(),
            "In BandLaneDetectionImpl::analyis().\nOut BandLaneDetectionImpl::analyis().\n");
  expectSameBand(byCircle[0].bands[0], byRect[0].bands[0]);
}

TEST(ComputeMedian, UpperMiddleElement) {
  const struct {
    std::vector<float> values;
    float expected;
  } cases[] = {
      {{4, 1, 3, 2}, 3},
      {{5, 1, 3}, 3},
      {{7}, 7},
      {{2, 2, 9, 9}, 9},
      {{-1.5f, 0.5f}, 0.5f},
  };
  for (const auto& c : cases) {
    cv::Mat m(1, static_cast<int>(c.values.size()), CV_32F, const_cast<float*>(c.values.data()));
    EXPECT_EQ(BandLaneDetectionImpl::computeMedian(m), c.expected);
  }
  EXPECT_EQ(BandLaneDetectionImpl::computeMedian(cv::Mat()), 0.0f);
  // A view into a larger matrix reads only its own elements.
  cv::Mat big = (cv::Mat_<float>(3, 3) << 100, 100, 100, 100, 1, 2, 100, 3, 4);
  EXPECT_EQ(BandLaneDetectionImpl::computeMedian(big(cv::Rect(1, 1, 2, 2))), 3.0f);
}

}  // namespace
}  // namespace viraduve
