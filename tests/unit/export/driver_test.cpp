#include <gtest/gtest.h>

#include <filesystem>
#include <stdexcept>

#include <opencv2/imgcodecs.hpp>

#include "export/export_driver.h"
#include "test_support.h"

namespace viraduve {
namespace Export {
namespace {

namespace fs = std::filesystem;

// Channel c: a dark picture with a bright block whose place depends on c.
void writeCapture(const test::TempDir& dir, int channels, int cols = 200, int rows = 100) {
  for (int c = 0; c < channels; ++c) {
    cv::Mat m(rows, cols, CV_16UC1, cv::Scalar(3000 + 1000 * c));
    m(cv::Rect(20 + 30 * c, 30, 40, 40)).setTo(60000);
    test::writeImage(dir.file("ch" + std::to_string(c) + ".tif"), m);
  }
}

struct Request {
  ExportAttributes attributes;
  ImageMode mode = ImageMode_Chemi;
  std::vector<CloudImageParam> params;
  std::vector<uint32_t> overlay;
  std::vector<ChannelAnnotations> annotations;
  std::vector<CloudFrame> frames;
  std::vector<std::vector<CloudLane>> lanes;

  Request(int channels, std::vector<uint32_t> list) : params(channels), overlay(std::move(list)) {
    attributes.dpi = 254;
    attributes.width = 2.0f;   // 200 pixels
    attributes.height = 1.0f;  // 100 pixels
    attributes.format = 1;
    attributes.channelSelection = 2;
  }

  std::vector<std::string> run(const std::string& dir) const {
    std::string result = "untouched";
    std::vector<std::string> names;
    runImageExport(result, dir, dir, lanes, frames, params, attributes, mode, {}, 0, overlay,
                   annotations, {}, {}, names);
    EXPECT_EQ(result, "");
    return names;
  }
};

std::vector<std::string> filesIn(const std::string& folder) {
  std::vector<std::string> names;
  for (const auto& e : fs::directory_iterator(folder)) names.push_back(e.path().filename().string());
  std::sort(names.begin(), names.end());
  return names;
}

TEST(RunImageExport, ListedChannelsWithoutMergeInTheOutputFolder) {
  test::TempDir dir;
  writeCapture(dir, 3);
  Request request(3, {0, 2});
  const std::vector<std::string> names = request.run(dir.path());
  EXPECT_EQ(names, (std::vector<std::string>{"ch0", "ch1", "ch2"}));
  EXPECT_EQ(filesIn(dir.file("output")), (std::vector<std::string>{"ch0.png", "ch2.png"}));
  const cv::Mat ch2 = cv::imread(dir.file("output/ch2.png"), cv::IMREAD_UNCHANGED);
  ASSERT_EQ(ch2.type(), CV_8UC3);
  EXPECT_EQ(ch2.size(), cv::Size(200, 100));
  // Grey rendering of the full range, in 8 bits: 60000 / 255 and 5000 / 255, rounded.
  EXPECT_EQ(ch2.at<cv::Vec3b>(50, 100), cv::Vec3b(235, 235, 235));
  EXPECT_EQ(ch2.at<cv::Vec3b>(10, 10), cv::Vec3b(20, 20, 20));
}

class FormatCode : public ::testing::TestWithParam<uint32_t> {};

TEST_P(FormatCode, UnknownCodesWriteTiff) {
  test::TempDir dir;
  writeCapture(dir, 1);
  Request request(1, {0});
  request.attributes.format = GetParam();
  request.run(dir.path());
  EXPECT_EQ(filesIn(dir.file("output")), (std::vector<std::string>{"ch0.tif"}));
}

INSTANTIATE_TEST_SUITE_P(Codes, FormatCode, ::testing::Values(0u, 3u, 4u, 9u));

TEST(RunImageExport, VisOverlayIsChannelZero) {
  test::TempDir dir;
  writeCapture(dir, 2);
  Request request(2, {0});
  request.mode = ImageMode_Vis;
  request.attributes.channelSelection = 1;
  request.params[0].r = 255;  // tinted, so the copy carries the rendering
  request.params[0].backgroundDetection = "black";
  const std::vector<std::string> names = request.run(dir.path());
  EXPECT_EQ(names.back(), "overlay");
  EXPECT_EQ(filesIn(dir.file("output")), (std::vector<std::string>{"overlay.png"}));
  const cv::Mat overlay = cv::imread(dir.file("output/overlay.png"), cv::IMREAD_UNCHANGED);

  test::TempDir single;
  writeCapture(single, 2);
  request.attributes.channelSelection = 2;
  request.run(single.path());
  const cv::Mat channel0 = cv::imread(single.file("output/ch0.png"), cv::IMREAD_UNCHANGED);
  ASSERT_EQ(overlay.size(), channel0.size());
  EXPECT_EQ(cv::norm(overlay, channel0, cv::NORM_INF), 0.0);
  EXPECT_EQ(overlay.at<cv::Vec3b>(50, 30), cv::Vec3b(0, 0, 235));
}

TEST(RunImageExport, MergedChannelsByScreen) {
  test::TempDir dir;
  writeCapture(dir, 2);
  Request request(2, {0, 1});
  request.mode = ImageMode_Fluo;
  request.attributes.channelSelection = 3;
  request.params[0].r = 255;
  request.params[1].g = 255;
  for (auto& p : request.params) p.backgroundDetection = "black";
  request.run(dir.path());
  EXPECT_EQ(filesIn(dir.file("output")), (std::vector<std::string>{"overlay.png"}));
  const cv::Mat merged = cv::imread(dir.file("output/overlay.png"), cv::IMREAD_UNCHANGED);
  // Where both blocks overlap (x 50..59) red and green add up; elsewhere one of them over
  // the other's dark background (3000 / 255 -> 12 red, 4000 / 255 -> 16 green).
  EXPECT_EQ(merged.at<cv::Vec3b>(50, 55), cv::Vec3b(0, 235, 235));
  EXPECT_EQ(merged.at<cv::Vec3b>(50, 30), cv::Vec3b(0, 16, 235));
  EXPECT_EQ(merged.at<cv::Vec3b>(50, 75), cv::Vec3b(0, 235, 12));
}

TEST(RunImageExport, BadIndicesEndWithARangeError) {
  test::TempDir dir;
  writeCapture(dir, 2);
  EXPECT_THROW(Request(2, {0, 5}).run(dir.path()), std::out_of_range);  // not a channel
  EXPECT_THROW(Request(2, {}).run(dir.path()), std::out_of_range);      // nothing listed
  Request nothingToMerge(2, {});
  nothingToMerge.attributes.channelSelection = 1;
  EXPECT_THROW(nothingToMerge.run(dir.path()), std::out_of_range);
}

TEST(RunImageExport, AnnotationOutsideWidensTheWhiteMargin) {
  test::TempDir dir;
  writeCapture(dir, 1);
  Request request(1, {0});
  request.attributes.exportAnnotation = true;
  request.attributes.width = 100.0f;  // the height decides: 100 rows at 254 dpi
  Annotation box;
  box.type = "shape";
  box.textColor = "#FF0000";
  box.x1 = -40;
  box.x2 = 30;
  box.y1 = 40;
  box.y2 = 60;
  request.annotations = {{0, {box}}};
  request.run(dir.path());
  const cv::Mat out = cv::imread(dir.file("output/ch0.png"), cv::IMREAD_UNCHANGED);
  // A margin of 42 columns on the left: 242 x 100 at full size.
  ASSERT_EQ(out.size(), cv::Size(242, 100));
  EXPECT_EQ(out.at<cv::Vec3b>(10, 5), cv::Vec3b(255, 255, 255));
  EXPECT_EQ(out.at<cv::Vec3b>(90, 20), cv::Vec3b(255, 255, 255));
  EXPECT_EQ(out.at<cv::Vec3b>(10, 50), cv::Vec3b(12, 12, 12));  // the picture (3000 / 257)
  const cv::Vec3b edge = out.at<cv::Vec3b>(40, 10);  // the box edge in the margin, red
  EXPECT_EQ(edge[2], 255);
  EXPECT_LT(edge[0] + edge[1], 60);

  // A box far away widens the margin no further than the picture's own width.
  request.annotations[0].annotations[0].x1 = -1000000000;
  request.run(dir.path());
  EXPECT_EQ(cv::imread(dir.file("output/ch0.png")).size(), cv::Size(402, 100));
}

TEST(RunImageExport, ExistingPictureIsReplacedWhole) {
  test::TempDir dir;
  writeCapture(dir, 1);
  fs::create_directory(dir.file("output"));
  test::writeImage(dir.file("output/ch0.png"), cv::Mat(5, 5, CV_8UC3, cv::Scalar(1, 2, 3)));
  Request(1, {0}).run(dir.path());
  // No temporary file is left beside it.
  EXPECT_EQ(filesIn(dir.file("output")), (std::vector<std::string>{"ch0.png"}));
  EXPECT_EQ(cv::imread(dir.file("output/ch0.png")).size(), cv::Size(200, 100));
}

}  // namespace
}  // namespace Export
}  // namespace viraduve
