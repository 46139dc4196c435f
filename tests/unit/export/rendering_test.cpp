#include <gtest/gtest.h>

#include <opencv2/core.hpp>

#include "export/channel_rendering.h"
#include "export/export_driver.h"
#include "viraduve/Exception.h"

namespace viraduve {
namespace Export {
namespace {

TEST(ImgConvertTo, ScalesBy255AndChangesChannels) {
  cv::Mat grey16(1, 3, CV_16UC1);
  grey16.at<ushort>(0, 0) = 0;
  grey16.at<ushort>(0, 1) = 382;  // 382 / 255 = 1.498 -> 1
  grey16.at<ushort>(0, 2) = 65535;
  cv::Mat bgr8;
  imgConvertTo(grey16, bgr8, 8, 3);
  ASSERT_EQ(bgr8.type(), CV_8UC3);
  EXPECT_EQ(bgr8.at<cv::Vec3b>(0, 1), cv::Vec3b(1, 1, 1));
  EXPECT_EQ(bgr8.at<cv::Vec3b>(0, 2), cv::Vec3b(255, 255, 255));

  cv::Mat back;
  imgConvertTo(bgr8, back, 16, 3);
  ASSERT_EQ(back.type(), CV_16UC3);
  EXPECT_EQ(back.at<cv::Vec3w>(0, 2), cv::Vec3w(65025, 65025, 65025));  // x255, not x257

  cv::Mat same;
  imgConvertTo(bgr8, same, 8, 3);
  EXPECT_EQ(cv::norm(same, bgr8, cv::NORM_INF), 0.0);
}

TEST(ImgConvertTo, UnsupportedSourcesRaiseTheExportError) {
  const struct {
    int type;
    int line;
  } cases[] = {{CV_32FC1, 97}, {CV_64FC3, 97}, {CV_32SC1, 97}, {CV_8UC4, 107}, {CV_16UC2, 107}};
  for (const auto& c : cases) {
    cv::Mat dst;
    try {
      imgConvertTo(cv::Mat(2, 2, c.type, cv::Scalar::all(0)), dst, 8, 3);
      ADD_FAILURE() << "no error for type " << c.type;
    } catch (const Exception& e) {
      EXPECT_EQ(e.code, -3);
      EXPECT_EQ(e.message, "ERROR! Image format not supported for export");
      EXPECT_EQ(e.line, c.line) << "type " << c.type;
    }
  }
}

TEST(DisplayMapping, WindowGammaAndClamp) {
  CloudImageParam p;
  p.img_min = 1000;
  p.img_max = 61000;
  cv::Mat in(1, 4, CV_16UC1);
  in.at<ushort>(0, 0) = 500;    // below the window
  in.at<ushort>(0, 1) = 16000;  // a quarter of the window
  in.at<ushort>(0, 2) = 61000;
  in.at<ushort>(0, 3) = 65000;  // above the window
  const struct {
    double gamma;
    ushort quarter;
  } cases[] = {{1.0, 16384}, {2.0, 4096}};
  for (const auto& c : cases) {
    p.img_gamma = c.gamma;
    const cv::Mat out = displayMapping(in, p);
    ASSERT_EQ(out.type(), CV_16UC1);
    EXPECT_EQ(out.at<ushort>(0, 0), 0);
    EXPECT_EQ(out.at<ushort>(0, 1), c.quarter) << "gamma " << c.gamma;
    EXPECT_EQ(out.at<ushort>(0, 2), 65535);
    EXPECT_EQ(out.at<ushort>(0, 3), 65535);
  }
}

TEST(TintChannel, DarkAndBrightBackgrounds) {
  const cv::Mat grey(2, 2, CV_8UC3, cv::Scalar::all(200));
  const struct {
    int r, g, b, background;
    cv::Vec3b bgr;
  } cases[] = {
      {255, 0, 0, -1, {0, 0, 200}},        // the signal's brightness in the colour
      {255, 0, 0, 1, {200, 200, 255}},     // saturation 255 - 200, full value
      {0, 0, 0, -1, {0, 0, 0}},            // the background's own colour fills the picture
      {255, 255, 255, 1, {255, 255, 255}},
      {0, 255, 0, -1, {0, 200, 0}},
  };
  for (const auto& c : cases) {
    const cv::Mat out = tintChannel(grey, c.r, c.g, c.b, c.background);
    ASSERT_EQ(out.type(), CV_8UC3);
    EXPECT_EQ(out.at<cv::Vec3b>(1, 1), c.bgr) << c.r << "," << c.g << "," << c.b << " bg " << c.background;
  }
}

TEST(BlendChannel, ScreenAndMultiplyTruncate) {
  const struct {
    uchar a, c;
    bool multiply;
    uchar expected;
  } cases[] = {
      {128, 128, true, 64},    // 64.25
      {128, 128, false, 191},  // 191.75
      {255, 77, true, 77},
      {0, 77, false, 77},
      {255, 0, false, 255},
      {0, 200, true, 0},
  };
  for (const auto& c : cases) {
    cv::Mat merged(1, 1, CV_8UC3, cv::Scalar::all(c.a));
    blendChannel(merged, cv::Mat(1, 1, CV_8UC3, cv::Scalar::all(c.c)), c.multiply);
    EXPECT_EQ(merged.at<cv::Vec3b>(0, 0)[1], c.expected)
        << int(c.a) << (c.multiply ? " * " : " screen ") << int(c.c);
  }
}

TEST(Saturation, MaskFollowsInversionAndMarkingContrasts) {
  cv::Mat raw(1, 3, CV_16UC1);
  raw.at<ushort>(0, 0) = 65535;
  raw.at<ushort>(0, 1) = 100;
  raw.at<ushort>(0, 2) = 0;
  CloudImageParam p;
  EXPECT_EQ(saturationMask(raw, p, ImageMode_Chemi, 0).at<uchar>(0, 2), 0);
  // An inverted copy carries the sensor's limit as 0.
  p.img_invert = true;
  const cv::Mat mask = saturationMask(65535 - raw, p, ImageMode_Chemi, 0);
  EXPECT_EQ(mask.at<uchar>(0, 0), 255);
  EXPECT_EQ(mask.at<uchar>(0, 2), 0);

  const struct {
    int r, g, b;
    cv::Vec3w colour;
  } cases[] = {
      {0, 255, 0, {65025, 0, 65025}},   // green channel: magenta marks
      {255, 255, 255, {0, 0, 65025}},   // grey rendering: red marks
      {40, 40, 999, {0, 0, 65025}},     // the alternative marking: red
  };
  for (const auto& c : cases) {
    CloudImageParam q;
    q.r = c.r;
    q.g = c.g;
    q.b = c.b;
    q.backgroundDetection = "black";
    // A grey one-channel rendering is widened to three channels.
    const cv::Mat marked = markSaturation(cv::Mat(1, 3, CV_16UC1, cv::Scalar(7)), mask, q, ImageMode_Fluo, 1);
    EXPECT_EQ(marked.at<cv::Vec3w>(0, 0), c.colour) << c.r << "," << c.g << "," << c.b;
    EXPECT_EQ(marked.at<cv::Vec3w>(0, 1), cv::Vec3w(7, 7, 7));
  }
}

TEST(AutoContrastWindow, IgnoresATenthOfAPercentAtEachEnd) {
  cv::Mat channel(100, 100, CV_16UC1, cv::Scalar(10000));
  channel.rowRange(50, 100).setTo(20000);
  for (int i = 0; i < 10; ++i) {  // 0.1 % dust and hot pixels
    channel.at<ushort>(0, i) = 0;
    channel.at<ushort>(99, i) = 65535;
  }
  CloudImageParam p;
  autoContrastWindow(channel, p, ImageMode_Chemi, 0);
  EXPECT_EQ(p.img_min, 10000);
  EXPECT_EQ(p.img_max, 20000);

  channel.at<ushort>(0, 10) = 5;  // the eleventh darkest sample opens the window
  autoContrastWindow(channel, p, ImageMode_Chemi, 0);
  EXPECT_EQ(p.img_min, 5);

  autoContrastWindow(cv::Mat(8, 8, CV_16UC1, cv::Scalar(65535)), p, ImageMode_Chemi, 0);
  EXPECT_EQ(p.img_min, 65534);  // a flat picture still gets a usable window
  EXPECT_EQ(p.img_max, 65535);
}

TEST(ChannelStep, FlattensASlopeAndKeepsTheSignal) {
  cv::Mat channel(300, 400, CV_16UC1);
  for (int y = 0; y < channel.rows; ++y) {
    for (int x = 0; x < channel.cols; ++x) channel.at<ushort>(y, x) = static_cast<ushort>(1000 + 10 * x);
  }
  channel(cv::Rect(200, 140, 12, 12)) += cv::Scalar(20000);
  const cv::Mat out = channelStep(channel, CloudImageParam(), ImageMode_Fluo, 1);
  ASSERT_EQ(out.type(), CV_16UC1);
  ASSERT_EQ(out.size(), channel.size());
  // The background's rise from left to right (4000) is gone, up to the estimate's smoothness.
  const double left = cv::mean(out(cv::Rect(40, 40, 20, 20)))[0];
  const double right = cv::mean(out(cv::Rect(340, 40, 20, 20)))[0];
  EXPECT_LT(std::abs(right - left), 400.0);
  EXPECT_NEAR(left, 1000.0, 400.0);  // brought down to the lowest background level
  const double signal = cv::mean(out(cv::Rect(203, 143, 6, 6)))[0];
  const double beside = cv::mean(out(cv::Rect(180, 143, 6, 6)))[0];
  EXPECT_NEAR(signal - beside, 20000.0, 1000.0);
}

}  // namespace
}  // namespace Export
}  // namespace viraduve
