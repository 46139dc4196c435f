// Inspection drawings: the saved picture, the window guard and the picture check.
#include <gtest/gtest.h>

#include <cstdlib>
#include <functional>
#include <string>
#include <vector>

#include <opencv2/imgcodecs.hpp>

#include "detector/BandLaneDetectionImpl.h"
#include "test_support.h"

namespace viraduve {
namespace {

Image greyPicture() {
  Image image;
  image.setMat(cv::Mat(120, 160, CV_16UC1, cv::Scalar(100 * 256)));
  return image;
}

std::vector<Lane2D> oneLaneTwoBands() {
  Lane2D lane;
  lane.x1 = 60;
  lane.y1 = 20;
  lane.x2 = 70;
  lane.y2 = 100;
  Band2D strong;
  strong.x1 = 50;
  strong.y1 = 30;
  strong.x2 = 80;
  strong.y2 = 40;
  strong.band_s_y = 0.5;
  Band2D weak = strong;
  weak.y1 = 60;
  weak.y2 = 70;
  weak.band_s_y = 0.1;
  lane.bands = {strong, weak};
  return {lane};
}

cv::Vec3b at(const cv::Mat& picture, int x, int y) { return picture.at<cv::Vec3b>(y, x); }

TEST(SaveLaneBands, FrameBlueLanesGreenBandsAboveThresholdRed) {
  test::TempDir dir;
  const std::string path = dir.file("drawing.png");
  BandLaneDetectionImpl detector;
  detector.saveLaneBands(greyPicture(), ROI{10, 5, 150, 110}, oneLaneTwoBands(), 0.2, path);
  const cv::Mat picture = cv::imread(path, cv::IMREAD_COLOR);
  ASSERT_FALSE(picture.empty());
  ASSERT_EQ(picture.size(), cv::Size(160, 120));
  EXPECT_EQ(at(picture, 10, 50), cv::Vec3b(255, 0, 0));   // frame, left side
  EXPECT_EQ(at(picture, 150, 110), cv::Vec3b(255, 0, 0)); // frame, bottom-right corner
  EXPECT_EQ(at(picture, 60, 20), cv::Vec3b(0, 255, 0));   // lane, top end
  EXPECT_EQ(at(picture, 70, 100), cv::Vec3b(0, 255, 0));  // lane, bottom end
  EXPECT_EQ(at(picture, 50, 35), cv::Vec3b(0, 0, 255));   // strong band, left side
  EXPECT_EQ(at(picture, 50, 65), cv::Vec3b(100, 100, 100));  // weak band: not drawn
  EXPECT_EQ(at(picture, 120, 80), cv::Vec3b(100, 100, 100)); // grey picture elsewhere
}

// highgui may end the process without a display; the library refuses instead.
TEST(DrawLaneBands, WithoutADisplayItRefuses) {
  struct SavedVariable {
    const char* name;
    bool had;
    std::string value;
  } saved[] = {{"DISPLAY", false, ""}, {"WAYLAND_DISPLAY", false, ""}};
  for (SavedVariable& v : saved) {
    if (const char* value = std::getenv(v.name)) {
      v.had = true;
      v.value = value;
    }
    unsetenv(v.name);
  }
  BandLaneDetectionImpl detector;
  const ROI frame{10, 5, 150, 110};
  for (int overload = 0; overload < 2; ++overload) {
    try {
      if (overload == 0)
        detector.drawLaneBands(greyPicture(), frame, oneLaneTwoBands(), "lanes");
      else
        detector.drawLaneBands(greyPicture(), frame, oneLaneTwoBands(), 0.2, "lanes");
      ADD_FAILURE() << "no error";
    } catch (const Exception& e) {
      EXPECT_EQ(e.code, -4);
      EXPECT_NE(e.message.find("No display"), std::string::npos);
      EXPECT_EQ(e.function, "viraduve::BandLaneDetectionImpl::drawLaneBands");
    }
  }
  for (const SavedVariable& v : saved)
    if (v.had) setenv(v.name, v.value.c_str(), 1);
}

TEST(Drawing, EmptyPictureIsAnOpenCvAssertion) {
  const Image empty;
  const ROI frame{0, 0, 1, 1};
  BandLaneDetectionImpl detector;
  test::TempDir dir;
  const struct {
    const char* function;
    std::function<void()> call;
  } cases[] = {
      {"viraduve::BandLaneDetectionImpl::saveLaneBands",
       [&] { detector.saveLaneBands(empty, frame, {}, 0.0, dir.file("a.png")); }},
      {"viraduve::BandLaneDetectionImpl::saveTPNImage",
       [&] { detector.saveTPNImage(empty, frame, {}, {0, 1}, {}, dir.file("b.png")); }},
      {"viraduve::BandLaneDetectionImpl::drawLaneBands",
       [&] { detector.drawLaneBands(empty, frame, {}, "w"); }},
  };
  for (const auto& c : cases) {
    try {
      c.call();
      ADD_FAILURE() << c.function;
    } catch (const cv::Exception& e) {
      EXPECT_EQ(e.code, -215) << c.function;
      EXPECT_EQ(e.err, "!src.empty() && (src.channels() == 1 || src.channels() == 3)");
      EXPECT_EQ(e.func, c.function);
      EXPECT_EQ(e.file, "DaduZerovoVur\\BandLaneDetection");
    }
  }
}

TEST(SaveTPNImage, DrawsTheMeasuredRowsAndLabels) {
  test::TempDir dir;
  const std::string path = dir.file("tpn.png");
  BandLaneDetectionImpl detector;
  // More lanes than factors: the lane without a factor gets no factor label.
  std::vector<Lane2D> lanes = oneLaneTwoBands();
  lanes.push_back(lanes[0]);
  lanes[1].x1 = lanes[1].x2 = 120;
  detector.saveTPNImage(greyPicture(), ROI{10, 5, 150, 110}, lanes, {25, 90}, {1.234},
                        path);
  const cv::Mat picture = cv::imread(path, cv::IMREAD_COLOR);
  ASSERT_FALSE(picture.empty());
  EXPECT_EQ(at(picture, 100, 25), cv::Vec3b(255, 0, 0));  // top of the measured rows
  EXPECT_EQ(at(picture, 100, 90), cv::Vec3b(255, 0, 0));  // bottom, 2 px thick
  EXPECT_EQ(at(picture, 120, 60), cv::Vec3b(0, 255, 0));  // second lane's line
}

}  // namespace
}  // namespace viraduve
