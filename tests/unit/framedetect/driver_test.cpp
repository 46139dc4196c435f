// The frame-detection driver on capture folders: channel 0 only, its flips, its angle, the
// log frame around the detection, and the failures that must reach the caller.
#include <regex>
#include <stdexcept>
#include <string>
#include <vector>

#include <gtest/gtest.h>
#include <opencv2/imgproc.hpp>

#include "pipeline/ImageProcessing.h"
#include "roi_compare.h"
#include "test_support.h"
#include "viraduve/Exception.h"

namespace {

using viraduve::ImageParam;
using viraduve::ROI;
using viraduve::test::TempDir;

// A 16-bit capture whose high bytes are membranes at 200 on a background of 20 with
// isolated specks at 21 (a clearly two-level picture for the blob route).
cv::Mat capture16(const std::vector<cv::Rect>& membranes) {
  cv::Mat m(600, 800, CV_8UC1, cv::Scalar(20));
  for (int y = 5; y < m.rows; y += 10) {
    for (int x = 5; x < m.cols; x += 10) m.at<uchar>(y, x) = 21;
  }
  for (const auto& r : membranes) cv::rectangle(m, r, 200, cv::FILLED);
  cv::Mat wide;
  m.convertTo(wide, CV_16UC1, 257.0);
  return wide;
}

struct DriverRun {
  std::vector<ROI> rois;
  std::string log;
};

DriverRun run(const std::string& dir, const std::vector<ImageParam>& params, viraduve::ImageMode mode) {
  DriverRun r;
  viraduve::test::StdoutCapture capture;
  try {
    viraduve::ImageProcessing::runAnalysisFrameDetection(dir, r.rois, params, mode);
  } catch (...) {
    capture.finish();
    throw;
  }
  r.log = capture.finish();
  return r;
}

TEST(FrameDetectionDriver, DetectsInChannelZeroAndLogsItsFrame) {
  TempDir dir;
  viraduve::test::writeImage(dir.file("ch0.tif"), capture16({{50, 100, 200, 400}}));
  // A second channel is never read.
  viraduve::test::writeImage(dir.file("ch1.tif"), capture16({}));
  const DriverRun r = run(dir.path(), {ImageParam{}, ImageParam{}}, viraduve::ImageMode_Fluo);
  EXPECT_EQ(r.rois, (std::vector<ROI>{{50, 100, 250, 500}}));

  const std::string start = "ImageProcessing::runAnalysisFrameDetection is started.\nInput: \n"
                            "image_dir: " + dir.path() + "\n====ImageParam====\n";
  EXPECT_EQ(r.log.rfind(start, 0), 0u) << r.log;
  EXPECT_NE(r.log.find("image_mode: ImageMode_Fluo\nLoaded Image Path is " + dir.path() +
                       "/ch0.tif\n"),
            std::string::npos)
      << r.log;
  EXPECT_EQ(r.log.find("ch1.tif"), std::string::npos);
  const std::regex end(
      "Output: \n====ROI====\nx1:  50, x2: 250, y1: 100, y2: 500\n"
      "ImageProcessing::runAnalysisFrameDetection is finished.\nTime taken: [0-9.e+-]+s\n$");
  EXPECT_TRUE(std::regex_search(r.log, end)) << r.log;
}

TEST(FrameDetectionDriver, MirrorsChannelZeroAndPassesItsAngle) {
  TempDir dir;
  viraduve::test::writeImage(dir.file("ch0.tif"), capture16({{50, 100, 200, 400}}));
  ImageParam flipped;
  flipped.img_flip_h = true;
  EXPECT_EQ(run(dir.path(), {flipped}, viraduve::ImageMode_Chemi).rois,
            (std::vector<ROI>{{550, 100, 750, 500}}));
  flipped.img_flip_v = true;
  EXPECT_EQ(run(dir.path(), {flipped}, viraduve::ImageMode_Chemi).rois,
            (std::vector<ROI>{{550, 100, 750, 500}}));
  flipped.img_flip_h = false;
  flipped.img_flip_v = true;
  EXPECT_EQ(run(dir.path(), {flipped}, viraduve::ImageMode_Chemi).rois,
            (std::vector<ROI>{{50, 100, 250, 500}}));

  ImageParam turned;
  turned.img_angle = 12.25;
  const DriverRun r = run(dir.path(), {turned}, viraduve::ImageMode_Vis);
  EXPECT_NE(r.log.find("ratation_angle: 12.25 degree\n"), std::string::npos);
  EXPECT_FALSE(r.rois.empty());
}

TEST(FrameDetectionDriver, FailuresReachTheCaller) {
  TempDir dir;
  try {
    run(dir.path(), {ImageParam{}}, viraduve::ImageMode_Fluo);
    ADD_FAILURE() << "no exception for a missing ch0.tif";
  } catch (const viraduve::Exception& e) {
    EXPECT_EQ(e.code, -3);
  }
  // Only "ch0.tif" by that name is channel 0.
  viraduve::test::writeImage(dir.file("ch00.tif"), capture16({}));
  EXPECT_THROW(run(dir.path(), {ImageParam{}}, viraduve::ImageMode_Fluo), viraduve::Exception);

  viraduve::test::writeImage(dir.file("ch0.tif"), capture16({}));
  EXPECT_THROW(run(dir.path(), {}, viraduve::ImageMode_Fluo), std::out_of_range);
}

}  // namespace
