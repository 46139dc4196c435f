// The detection, update and analysis drivers: their checks, frame clamping, channel merge
// and polarity, on small captures written to a temporary folder.
#include <gtest/gtest.h>

#include <functional>
#include <stdexcept>
#include <string>
#include <vector>

#include <opencv2/core.hpp>

#include "pipeline/ImageProcessing.h"
#include "pipeline/lane_merge.h"
#include "test_support.h"
#include "viraduve/Exception.h"

namespace viraduve {
namespace {

using ImageProcessing::LanesPerFrame;

void writeChannels(const test::TempDir& dir, const std::vector<cv::Mat>& channels) {
  for (std::size_t i = 0; i < channels.size(); ++i)
    test::writeImage(dir.file("ch" + std::to_string(i) + ".tif"), channels[i]);
}

void expectException(const std::function<void()>& call, int code, const std::string& message,
                     const std::string& function, int line) {
  try {
    call();
    ADD_FAILURE() << "no exception, expected " << message;
  } catch (const Exception& e) {
    EXPECT_EQ(e.code, code);
    EXPECT_EQ(e.message, message);
    EXPECT_EQ(e.function, function);
    EXPECT_EQ(e.file, "DaduZerovoVur\\ImageProcessing");
    EXPECT_EQ(e.line, line);
  }
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

TEST(DetectionDriver, FileAndParameterCountsMustMatch) {
  test::TempDir dir;
  const cv::Mat m(20, 20, CV_16U, cv::Scalar(5));
  writeChannels(dir, {m, m, m});
  LanesPerFrame lanes;
  expectException(
      [&] {
        ImageProcessing::runBandLandeDetection(dir.path(), lanes, {ROI{0, 0, 19, 19}},
                                               std::vector<ImageParam>(2), ImageMode_Chemi);
      },
      -4, "ERROR! Number of image files is not equal to number of image parameter set",
      "ImageProcessing::runBandLandeDetection", 313);
  EXPECT_TRUE(lanes.empty());
}

TEST(DetectionDriver, ChannelSizesMustMatch) {
  test::TempDir dir;
  writeChannels(dir, {cv::Mat(20, 20, CV_16U, cv::Scalar(5)), cv::Mat(20, 21, CV_16U, cv::Scalar(5))});
  LanesPerFrame lanes;
  expectException(
      [&] {
        ImageProcessing::runBandLandeDetection(dir.path(), lanes, {ROI{0, 0, 19, 19}},
                                               std::vector<ImageParam>(2), ImageMode_Chemi);
      },
      -4, "ERROR! Size of images are different!", "ImageProcessing::runBandLandeDetection", 353);
}

TEST(DetectionDriver, NoFramesNoDetector) {
  test::TempDir dir;
  const cv::Mat m(20, 20, CV_16U, cv::Scalar(5));
  writeChannels(dir, {m, m});
  LanesPerFrame lanes;
  test::StdoutCapture capture;
  ImageProcessing::runBandLandeDetection(dir.path(), lanes, {}, std::vector<ImageParam>(2),
                                         ImageMode_Chemi);
  const std::string log = capture.finish();
  EXPECT_TRUE(lanes.empty());
  EXPECT_EQ(log.find("BandLaneDetectionImpl"), std::string::npos) << log;
  EXPECT_EQ(log.rfind("In ImageProcessing::runBandLandeDetection().\nInput: \nimage_dir: " + dir.path() + "\n", 0), 0u) << log;
  EXPECT_NE(log.find("image_mode: ImageMode_Chemi\n"), std::string::npos);
  EXPECT_NE(log.find("Num of raw images = 2\n"), std::string::npos);
  // Chemi: channel 0 has a bright background and is turned round, channel 1 is not.
  EXPECT_NE(log.find("invert ch 0 to get white signal for band lane detection \n"), std::string::npos);
  EXPECT_EQ(log.find("invert ch 1"), std::string::npos);
  EXPECT_NE(log.find("Image overlay is done.\n"), std::string::npos);
  EXPECT_NE(log.find("lane detections for all frames is started\n"
                     "lane detection for all frames is finished\n"
                     "In ImageProcessing::runBandLandeDetection().\nTime taken: "),
            std::string::npos)
      << log;
}

TEST(DetectionDriver, FrameIsClampedToTheImageBeforeDetection) {
  test::TempDir dir;
  writeChannels(dir, {cv::Mat(800, 1000, CV_16U, cv::Scalar(100))});
  LanesPerFrame lanes;
  test::StdoutCapture capture;
  try {
    ImageProcessing::runBandLandeDetection(dir.path(), lanes, {ROI{-10, -10, 5000, 5000}},
                                           std::vector<ImageParam>(1), ImageMode_UV);
  } catch (const std::exception&) {
    // Only the rectangle handed to the detector matters here.
  }
  const std::string log = capture.finish();
  EXPECT_NE(log.find("lane detection for frame 0\n====ROI====\nx1:   0, x2: 999, y1:   0, y2: 799\n"),
            std::string::npos)
      << log;
}

TEST(LaneMerge, FurtherChannelsAppendTheirBandsLaneByLane) {
  std::vector<std::vector<Lane2D>> perChannel(3);
  for (uint32_t c = 0; c < 3; ++c) {
    for (int j = 0; j < 2; ++j) {
      Lane2D lane = laneAt(10 + 20 * j + static_cast<int>(c), 0, 10 + 20 * j, 50, 8);
      lane.bands.push_back(bandAt(c, j, 1, 2, 3));
      if (c == 1) lane.bands.push_back(bandAt(c, j, 4, 5, 6));
      perChannel[c].push_back(lane);
    }
  }
  const std::vector<Lane2D> merged = ImageProcessing::mergeChannelLanes(perChannel);
  ASSERT_EQ(merged.size(), 2u);
  for (int j = 0; j < 2; ++j) {
    EXPECT_EQ(merged[j].x1, 10 + 20 * j);  // the lane as channel 0 gave it
    ASSERT_EQ(merged[j].bands.size(), 4u);
    const uint32_t channels[] = {0, 1, 1, 2};
    for (int k = 0; k < 4; ++k) {
      EXPECT_EQ(merged[j].bands[k].channel, channels[k]);
      EXPECT_EQ(merged[j].bands[k].x1, j);
    }
    EXPECT_EQ(merged[j].bands[2].y1, 4);
  }
  perChannel[2].pop_back();
  EXPECT_THROW(ImageProcessing::mergeChannelLanes(perChannel), std::out_of_range);
  EXPECT_THROW(ImageProcessing::mergeChannelLanes({}), std::out_of_range);
}

TEST(LaneMerge, LanesAndBandsAreClampedIntoTheFrame) {
  std::vector<Lane2D> lanes{laneAt(5, 8, 120, 300, 10)};
  lanes[0].bands.push_back(bandAt(0, 95, 40, 130, 50));
  lanes[0].bands.push_back(bandAt(0, 2, 2, 20, 400));
  ImageProcessing::clampLanesInto(lanes, ROI{10, 10, 100, 200});
  const Lane2D& l = lanes[0];
  EXPECT_EQ((std::vector<int>{l.x1, l.y1, l.x2, l.y2}), (std::vector<int>{10, 10, 100, 200}));
  const Band2D& a = l.bands[0];
  EXPECT_EQ((std::vector<int>{a.x1, a.y1, a.x2, a.y2}), (std::vector<int>{95, 40, 100, 50}));
  const Band2D& b = l.bands[1];
  EXPECT_EQ((std::vector<int>{b.x1, b.y1, b.x2, b.y2}), (std::vector<int>{10, 10, 20, 200}));
  EXPECT_EQ(l.width, 10);
}

TEST(UpdateDriver, FileAndParameterCountsMustMatch) {
  test::TempDir dir;
  writeChannels(dir, {cv::Mat(20, 20, CV_16U, cv::Scalar(5))});
  LanesPerFrame lanes(1);
  expectException(
      [&] {
        ImageProcessing::updateBandDetection(dir.path(), lanes, std::vector<ImageParam>(2),
                                             ImageMode_Chemi);
      },
      -4, "ERROR in updateBandDetection()! Image File Number is Not Equal to Image Parameter Number",
      "ImageProcessing::updateBandDetection", 600);
}

// Two channels in mode Chemi: channel 0 is measured inverted, channel 1 as stored.
TEST(AnalysisDriver, MeasuresEveryChannelWithItsPolarity) {
  test::TempDir dir;
  cv::Mat ch0(60, 50, CV_16U, cv::Scalar(60000));
  ch0(cv::Rect(10, 20, 10, 4)).setTo(50000);
  cv::Mat ch1(60, 50, CV_16U, cv::Scalar(200));
  ch1(cv::Rect(10, 30, 10, 4)).setTo(1200);
  writeChannels(dir, {ch0, ch1});

  LanesPerFrame frames(2);
  frames[0].push_back(laneAt(15, 5, 15, 55, 12));
  frames[0][0].bands.push_back(bandAt(0, 10, 20, 19, 23));
  frames[0][0].bands.push_back(bandAt(1, 10, 30, 19, 33));
  frames[1].push_back(laneAt(40, 5, 40, 55, 6));
  frames[1][0].bands.push_back(bandAt(1, 38, 10, 41, 11));

  test::StdoutCapture capture;
  ImageProcessing::runBandLandeAnalysis(dir.path(), frames, std::vector<ImageParam>(2),
                                        ImageMode_Chemi);
  const std::string log = capture.finish();
  EXPECT_NE(log.find("invert ch 0for band lane detection \n"), std::string::npos);
  EXPECT_EQ(log.find("invert ch 1"), std::string::npos);
  EXPECT_EQ(log.rfind("ImageProcessing::runBandLandeAnalysis 1 is started.\nInput: \n", 0), 0u);
  EXPECT_NE(log.find("ImageProcessing::runBandLandeAnalysis 1 is finished.\nTime taken: "),
            std::string::npos);

  const Band2D& b0 = frames[0][0].bands[0];
  const Band2D& b1 = frames[0][0].bands[1];
  EXPECT_EQ(b0.volume, 40 * 15535.0);  // 65535 - 50000 inverted
  EXPECT_EQ(b0.local_bg_volume, 40 * 10000.0);  // over the inverted background 5535
  EXPECT_EQ(b1.volume, 40 * 1200.0);
  EXPECT_EQ(b1.local_bg_volume, 40 * 1000.0);
  EXPECT_EQ(frames[1][0].bands[0].volume, 8 * 200.0);
  // Channel 0 was measured first, when channel 1's band still held 0; channel 1 then saw
  // both bands.
  EXPECT_EQ(b0.purity_band, 1.0);
  EXPECT_EQ(b1.purity_band, 40000.0 / 440000.0);
}

}  // namespace
}  // namespace viraduve

namespace viraduve {
namespace {

// A folder without channel files is a failed analysis, not an answer that repeats the
// request's own measures.
TEST(AnalysisDrivers, FolderWithoutChannelFilesFailsToLoad) {
  test::TempDir empty;
  const std::vector<ImageParam> params(1);
  LanesPerFrame lanes(1, std::vector<Lane2D>(1));
  lanes[0][0].bands.resize(1);
  lanes[0][0].bands[0].volume = 123.0;
  for (const std::string& dir : {empty.path(), empty.file("missing")}) {
    try {
      ImageProcessing::runBandLandeAnalysis(dir, lanes, params, ImageMode_UV);
      FAIL() << dir;
    } catch (const Exception& e) {
      EXPECT_EQ(e.code, -3);
      EXPECT_EQ(e.message, "ERROR! Image File Not Sucessfully Loaded");
    }
    std::vector<Region2D> regions(1);
    EXPECT_THROW(ImageProcessing::runRegionAnalysis(dir, regions, params, ImageMode_UV),
                 Exception);
  }
  EXPECT_EQ(lanes[0][0].bands[0].volume, 123.0);
}

}  // namespace
}  // namespace viraduve
