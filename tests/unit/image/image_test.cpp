#include <gtest/gtest.h>

#include <string>

#include <opencv2/imgcodecs.hpp>

#include "test_support.h"
#include "viraduve/Exception.h"
#include "viraduve/Image.h"

namespace viraduve {
namespace {

using test::StdoutCapture;
using test::TempDir;

cv::Mat ramp(int rows, int cols) {
  cv::Mat m(rows, cols, CV_16UC1);
  for (int r = 0; r < rows; ++r) {
    for (int c = 0; c < cols; ++c) m.at<ushort>(r, c) = static_cast<ushort>(r * cols + c + 1);
  }
  return m;
}

bool same(const cv::Mat& a, const cv::Mat& b) {
  return a.size() == b.size() && a.type() == b.type() && cv::norm(a, b, cv::NORM_INF) == 0.0;
}

// The code, message and line of the load error for a file.
void expectLoadError(const std::string& dir, const std::string& name, const char* message,
                     int line) {
  try {
    Image image(dir, name);
    FAIL() << name << " loaded";
  } catch (const Exception& e) {
    EXPECT_EQ(e.code, -3);
    EXPECT_EQ(e.message, message);
    EXPECT_EQ(e.function, "viraduve::Image::_load");
    EXPECT_EQ(e.line, line);
    EXPECT_EQ(std::string(e.what()), std::string("dadodazeda Error: ") + message +
                                         " (code: -3) in the function viraduve::Image::_load "
                                         "of file DaduZerovoVur\\Image at line " +
                                         std::to_string(line));
  }
}

TEST(ImageLoad, SixteenAndEightBitFiles) {
  TempDir dir;
  const cv::Mat deep = ramp(3, 4);
  test::writeImage(dir.file("ch0.tif"), deep);
  cv::Mat shallow(2, 2, CV_8UC1);
  shallow.at<uchar>(0, 0) = 0;
  shallow.at<uchar>(0, 1) = 1;
  shallow.at<uchar>(1, 0) = 128;
  shallow.at<uchar>(1, 1) = 255;
  test::writeImage(dir.file("ch1.tif"), shallow);

  StdoutCapture out;
  Image a(dir.path(), "ch0.tif");
  Image b(dir.path(), "ch1.tif");
  EXPECT_EQ(out.finish(), "Loaded Image Path is " + dir.file("ch0.tif") +
                              "\nLoaded Image Path is " + dir.file("ch1.tif") + "\n");
  EXPECT_EQ(a.cols(), 4);
  EXPECT_EQ(a.rows(), 3);
  EXPECT_EQ(a.exposureTime(), 0.0f);
  EXPECT_TRUE(same(a.mat(), deep));
  EXPECT_TRUE(same(cv::imdecode(a.encoded(), cv::IMREAD_UNCHANGED), deep));
  // 8-bit values are scaled by 255 into 16 bits.
  ASSERT_EQ(b.mat().type(), CV_16UC1);
  EXPECT_EQ(b.mat().at<ushort>(0, 1), 255);
  EXPECT_EQ(b.mat().at<ushort>(1, 0), 128 * 255);
  EXPECT_EQ(b.mat().at<ushort>(1, 1), 65025);
}

TEST(ImageLoad, RefusedFiles) {
  TempDir dir;
  test::writeImage(dir.file("float.tif"), cv::Mat(4, 4, CV_32FC1, cv::Scalar(0.5)));
  StdoutCapture out;
  expectLoadError(dir.path(), "missing.tif", "ERROR! Image File Not Sucessfully Loaded", 203);
  expectLoadError(dir.path(), "float.tif", "ERROR! Image Format is Not Supported", 200);
}

TEST(ImageOps, FlipsInvertAndExposure) {
  Image src;
  src.setMat(ramp(3, 5));
  src.setExposureTime(2.5f);
  const struct {
    bool h, v;
    int code;
  } flips[] = {{true, false, 1}, {false, true, 0}, {true, true, -1}};
  for (const auto& f : flips) {
    Image dst;
    flipChannelImage(src, dst, f.h, f.v);
    cv::Mat expected;
    cv::flip(src.mat(), expected, f.code);
    EXPECT_TRUE(same(dst.mat(), expected)) << f.code;
    EXPECT_EQ(dst.exposureTime(), 2.5f);
    EXPECT_EQ(dst.cols(), 5);
  }
  Image same_object = src;
  flipChannelImage(same_object, same_object, false, false);
  EXPECT_TRUE(same(same_object.mat(), src.mat()));

  Image inverted;
  invertChannelImage(src, inverted, 65535);
  EXPECT_EQ(inverted.mat().at<ushort>(0, 0), 65534);
  Image saturated;
  invertChannelImage(src, saturated, 3);
  EXPECT_EQ(saturated.mat().at<ushort>(2, 4), 0);  // 3 - 15 saturates at 0
}

TEST(ImageOps, Rotation) {
  Image src;
  src.setMat(ramp(20, 30));
  Image tiny;
  rotateChannelImage(src, tiny, 0.0005f, 1);
  EXPECT_TRUE(same(tiny.mat(), src.mat()));

  Image flat;
  flat.setMat(cv::Mat(20, 30, CV_16UC1, cv::Scalar(30000)));
  const struct {
    int fillMode;
    ushort corner;
  } fills[] = {{1, 65535}, {-1, 0}, {0, 0}};
  for (const auto& f : fills) {
    Image rotated;
    rotateChannelImage(flat, rotated, 45.0f, f.fillMode);
    ASSERT_EQ(rotated.mat().type(), CV_16UC1);
    EXPECT_EQ(rotated.cols(), rotated.mat().cols);
    EXPECT_GT(rotated.cols(), 30);
    EXPECT_EQ(rotated.mat().at<ushort>(0, 0), f.corner) << f.fillMode;
    EXPECT_EQ(rotated.mat().at<ushort>(rotated.rows() / 2, rotated.cols() / 2), 30000);
  }
}

TEST(ImageTypeText, DepthAndChannels) {
  EXPECT_EQ(Image::typeText(CV_16UC1), "16UC1");
  EXPECT_EQ(Image::typeText(CV_8SC3), "8SC3");
  EXPECT_EQ(Image::typeText(CV_64FC2), "64FC2");
  EXPECT_EQ(Image::typeText(CV_16FC1), "UserC1");
}

}  // namespace
}  // namespace viraduve
