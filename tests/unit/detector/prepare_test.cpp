// Entry points, data preparation and the mapping back to image coordinates.
#include <gtest/gtest.h>

#include <string>
#include <vector>

#include <opencv2/core.hpp>

#include "detector/BandLaneDetectionImpl.h"
#include "quiet.h"

namespace viraduve {
namespace {

Image imageOf(const cv::Mat& picture) {
  Image image;
  image.setMat(picture);
  return image;
}

TEST(PrepareData, FrameMustLieInsideTheImage) {
  const cv::Mat img(40, 60, CV_8UC1, cv::Scalar(10));
  const struct {
    ROI roi;
    bool valid;
  } cases[] = {
      {{0, 0, 59, 39}, true},     // the whole image
      {{10, 5, 10, 5}, true},     // a single pixel
      {{0, 0, 60, 39}, false},    // x2 = cols
      {{0, 0, 59, 40}, false},    // y2 = rows
      {{-1, 0, 59, 39}, false},
      {{0, -1, 59, 39}, false},
      {{30, 0, 20, 39}, false},   // inverted: no pixel to work on
  };
  for (const auto& c : cases) {
    BandLaneDetectionImpl detector;
    if (c.valid) {
      test::logOf([&] { detector.prepareData(img, c.roi); });
      EXPECT_EQ(detector.normed_image_.cols, c.roi.x2 - c.roi.x1 + 1);
      EXPECT_EQ(detector.normed_image_.rows, c.roi.y2 - c.roi.y1 + 1);
      EXPECT_EQ(detector.img_norm_.size(), img.size());
    } else {
      try {
        test::logOf([&] { detector.prepareData(img, c.roi); });
        ADD_FAILURE() << "accepted " << c.roi.x1 << "," << c.roi.y1 << "," << c.roi.x2 << ","
                      << c.roi.y2;
      } catch (const Exception& e) {
        EXPECT_EQ(e.code, -4);
        EXPECT_EQ(e.message, "ERROR! In valid ROI");
        EXPECT_EQ(e.function, "viraduve::BandLaneDetectionImpl::prepareData");
      }
    }
  }
}

// Polarity: -1 keeps, 1 inverts, 0 inverts when the mean of the four border strips
// (corners counted in both strips that hold them) is above 0.4, and remembers the choice.
TEST(PrepareData, Polarity) {
  // 25 x 25: the strips hold 100 samples, so k bright samples give a mean of k / 100.
  const struct {
    int background, brightSamples, decided;
  } cases[] = {{0, 40, -1}, {0, 41, 1}, {0, 0, -1}, {-1, 100, -1}, {1, 0, 1}};
  for (const auto& c : cases) {
    cv::Mat img(25, 25, CV_8UC1, cv::Scalar(0));
    int k = c.brightSamples;
    if (k == 100) img.setTo(255);
    // Non-corner samples of the top row, then of the bottom row, each counted once.
    for (int x = 1; x <= 23 && k > 0 && k < 100; ++x, --k) img.at<uchar>(0, x) = 255;
    for (int x = 1; x <= 23 && k > 0 && k < 100; ++x, --k) img.at<uchar>(24, x) = 255;
    BandLaneDetectionImpl detector;
    detector.background_ = c.background;
    test::logOf([&] { detector.prepareData(img, ROI{0, 0, 24, 24}); });
    EXPECT_EQ(detector.background_, c.decided) << c.brightSamples;
    const float interior = img.at<uchar>(12, 12) / 255.0f;
    EXPECT_FLOAT_EQ(detector.image_(12, 12), c.decided == 1 ? 1.0f - interior : interior);
  }
}

TEST(ScaleAndShift, MapsToImageCoordinatesAndClampsToTheFrame) {
  // Lane (5, 0)-(120, 99) and band (-15, 30)-(20, 40) in the frame (10, 20)-(110, 119).
  // Scale 2 divides, shifts and rounds outward by 0.49: 5/2 + 10 - 0.49 = 12.01 -> 12,
  // 99/2 + 20 + 0.49 = 69.99 -> 70, 30/2 + 20 - 0.49 = 34.51 -> 35.
  const struct {
    double scale;
    std::vector<int> lane, band;
    int width;
  } cases[] = {{1.0, {15, 20, 110, 119}, {10, 50, 30, 60}, 21},
               {1.00005, {15, 20, 110, 119}, {10, 50, 30, 60}, 21},
               {2.0, {12, 20, 70, 70}, {10, 35, 20, 40}, 11}};
  for (const auto& c : cases) {
    Lane2D lane;
    lane.x1 = 5, lane.y1 = 0, lane.x2 = 120, lane.y2 = 99, lane.mw = true;
    Band2D band;
    band.x1 = -15, band.y1 = 30, band.x2 = 20, band.y2 = 40;
    lane.bands = {band};
    std::vector<Lane2D> lanes = {lane};
    BandLaneDetectionImpl detector;
    detector.band_width_ = 21;
    test::logOf([&] { detector.scaleAndShiftBandLanes(lanes, ROI{10, 20, 110, 119}, c.scale); });
    const Lane2D& l = lanes[0];
    const Band2D& b = l.bands.at(0);
    EXPECT_EQ((std::vector<int>{l.x1, l.y1, l.x2, l.y2}), c.lane) << c.scale;
    EXPECT_EQ((std::vector<int>{b.x1, b.y1, b.x2, b.y2}), c.band) << c.scale;
    EXPECT_EQ(l.width, c.width) << c.scale;
    EXPECT_FALSE(l.mw);
    EXPECT_TRUE(l.update_flag);
  }
}

TEST(Detect, UndecodablePictureIsAnOpenCvAssertion) {
  const Image empty;
  BandLaneDetectionImpl detector;
  std::vector<Lane2D> lanes;
  try {
    test::logOf([&] { detector.detect(empty, ROI{0, 0, 0, 0}, lanes); });
    ADD_FAILURE() << "no error";
  } catch (const cv::Exception& e) {
    EXPECT_EQ(e.code, -215);
    EXPECT_EQ(e.err, "!img.empty() && img.channels() == 1");
    EXPECT_EQ(e.func, "viraduve::BandLaneDetectionImpl::detect");
    EXPECT_EQ(e.file, "DaduZerovoVur\\BandLaneDetection");
  }
  try {
    test::logOf([&] { detector.detect_new(empty, ROI{0, 0, 0, 0}, {Lane2D{}}, 0, lanes); });
    ADD_FAILURE() << "no error";
  } catch (const cv::Exception& e) {
    EXPECT_EQ(e.code, -215);
    EXPECT_EQ(e.func, "viraduve::BandLaneDetectionImpl::detect_new");
  }
}

// Pictures without anything to find end in no lanes, never in an error.
TEST(Detect, FeaturelessPicturesGiveNoLanes) {
  const struct {
    const char* name;
    cv::Mat picture;
    ROI frame;
  } cases[] = {
      {"1x1", cv::Mat(1, 1, CV_16UC1, cv::Scalar(30000)), {0, 0, 0, 0}},
      {"blank", cv::Mat(50, 80, CV_16UC1, cv::Scalar(1000)), {0, 0, 79, 49}},
      {"one column of a blank", cv::Mat(50, 80, CV_16UC1, cv::Scalar(1000)), {7, 0, 7, 49}},
      {"one row of a blank", cv::Mat(50, 80, CV_16UC1, cv::Scalar(1000)), {0, 9, 79, 9}},
  };
  for (const auto& c : cases) {
    BandLaneDetectionImpl detector;
    std::vector<Lane2D> lanes = {Lane2D{}};
    const std::string log =
        test::logOf([&] { detector.detect(imageOf(c.picture), c.frame, lanes); });
    EXPECT_TRUE(lanes.empty()) << c.name;
    EXPECT_NE(log.find("No band is found, so can not define a lane!!"), std::string::npos)
        << c.name;
  }
}

TEST(DetectNew, NoLanesMeansNoWork) {
  BandLaneDetectionImpl detector;
  std::vector<Lane2D> out = {Lane2D{}};
  const std::string text = test::logOf([&] {
    detector.detect_new(imageOf(cv::Mat(20, 20, CV_16UC1, cv::Scalar(5))), ROI{0, 0, 19, 19}, {},
                        0, out);
  });
  EXPECT_TRUE(out.empty());
  EXPECT_NE(text.find("No lane for band detection"), std::string::npos);
  EXPECT_EQ(text.find("In BandLaneDetectionImpl::detectBands()."), std::string::npos);
}

TEST(CountLanesWithinAngle, DirectionIsTakenModulo180) {
  auto laneOf = [](int x1, int y1, int x2, int y2) {
    Lane2D lane;
    lane.x1 = x1;
    lane.y1 = y1;
    lane.x2 = x2;
    lane.y2 = y2;
    return lane;
  };
  const std::vector<Lane2D> lanes = {laneOf(10, 0, 10, 100), laneOf(10, 100, 10, 0),
                                     laneOf(0, 0, 100, 10)};
  BandLaneDetectionImpl detector;
  std::vector<Lane2D> outside;
  EXPECT_EQ(detector.countLanesWithinAngle(lanes, outside, 80.0f, 100.0f), 2u);
  ASSERT_EQ(outside.size(), 1u);
  EXPECT_EQ(outside[0].x2, 100);
  outside.clear();
  EXPECT_EQ(detector.countLanesWithinAngle2({}, outside, 80.0f, 100.0f), 0u);
  EXPECT_TRUE(outside.empty());
}

}  // namespace
}  // namespace viraduve
