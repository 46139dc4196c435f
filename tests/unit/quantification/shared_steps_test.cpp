// The measurement steps shared with the region and rolling-ball analyses.
#include <gtest/gtest.h>

#include <random>

#include <opencv2/core.hpp>
#include <opencv2/imgproc.hpp>

#include "detector/measure.h"
#include "viraduve/Exception.h"

namespace viraduve {
namespace {

// 4 x 3 image holding 1 .. 12 in row order.
cv::Mat oneToTwelve() {
  cv::Mat m(3, 4, CV_32F);
  for (int i = 0; i < 12; ++i) m.at<float>(i / 4, i % 4) = static_cast<float>(i + 1);
  return m;
}

TEST(GlobalBackgroundRect, ValueOnePastTheMiddleOfTheDescendingOrder) {
  const struct {
    ROI roi;
    double expected;
  } cases[] = {
      {{0, 0, 3, 2}, 5.0},   // n 12: index 7 of 12, 11, ..., 1
      {{1, 1, 2, 2}, 6.0},   // 11, 10, 7, 6: index 3
      {{0, 2, 3, 2}, 9.0},   // 12, 11, 10, 9: index 3
      {{0, 0, 2, 0}, 1.0},   // 3, 2, 1: index 2
      {{0, 0, 1, 0}, 1.0},   // two pixels: index 2 clamped to the last, 1
      {{2, 1, 2, 1}, 7.0},   // one pixel: itself
  };
  const cv::Mat A = oneToTwelve();
  for (const auto& c : cases)
    EXPECT_EQ(globalBackgroundRect(A, c.roi), c.expected)
        << c.roi.x1 << "," << c.roi.y1 << "," << c.roi.x2 << "," << c.roi.y2;
}

TEST(GlobalBackgroundRect, EmptyIsRefusedOutsideIsAnOpenCvError) {
  const cv::Mat A = oneToTwelve();
  for (const ROI& empty : {ROI{2, 0, 1, 2}, ROI{0, 2, 3, 1}, ROI{3, 3, 0, 0}}) {
    try {
      globalBackgroundRect(A, empty);
      ADD_FAILURE() << "no exception";
    } catch (const Exception& e) {
      EXPECT_EQ(e.code, -4);
    }
  }
  EXPECT_THROW(globalBackgroundRect(A, ROI{0, 0, 4, 2}), cv::Exception);
  EXPECT_THROW(globalBackgroundRect(A, ROI{-1, 0, 3, 2}), cv::Exception);
}

TEST(GlobalBackgroundCircle, MeanOfThePixelsStrictlyInside) {
  const cv::Mat A = oneToTwelve();
  // Radius 1: the centre only.
  EXPECT_EQ(globalBackgroundCircle(A, Circle{2, 1, 1}), 7.0);
  // Radius 2 around (1, 1): the 3 x 3 block, (dx, dy) = (+-1, +-1) is 2 < 4.
  EXPECT_EQ(globalBackgroundCircle(A, Circle{1, 1, 2}), (1 + 2 + 3 + 5 + 6 + 7 + 9 + 10 + 11) / 9.0);
  // Partly outside: around (0, 0) with radius 2 only (0..1, 0..1) are inside the image.
  EXPECT_EQ(globalBackgroundCircle(A, Circle{0, 0, 2}), (1 + 2 + 5 + 6) / 4.0);
  // No pixel inside: refused instead of 0 / 0.
  for (const Circle& c : {Circle{1, 1, 0}, Circle{-10, -10, 3}, Circle{100, 1, 20}}) {
    try {
      globalBackgroundCircle(A, c);
      ADD_FAILURE() << "no exception for " << c.x << "," << c.y << "," << c.radius;
    } catch (const Exception& e) {
      EXPECT_EQ(e.code, -4);
    }
  }
}

// The lane sum is cut to the lane's bounding box; it must equal the sum over an image-size
// mask and masked copy exactly, for tilted lanes and lanes that leave the image.
TEST(LaneMaskSum, EqualsTheImageSizeComputation) {
  std::mt19937 rng(2024);
  cv::Mat raw(210, 310, CV_16U);
  cv::randu(raw, 0, 65536);
  cv::Mat A;
  raw.convertTo(A, CV_32F);
  std::uniform_int_distribution<int> xs(-60, 370), ys(-40, 120), len(0, 200), widths(0, 90);
  int tested = 0;
  for (int i = 0; i < 600; ++i) {
    Lane2D lane;
    lane.x1 = xs(rng);
    lane.x2 = lane.x1 + std::uniform_int_distribution<int>(-40, 40)(rng);
    lane.y1 = ys(rng);
    lane.y2 = lane.y1 + len(rng);
    lane.width = widths(rng);
    cv::Mat M = cv::Mat::zeros(A.size(), CV_8U);
    const cv::Point corners[4] = {{static_cast<int>(lane.x1 - lane.width * 0.5), lane.y1},
                                  {static_cast<int>(lane.x1 + lane.width * 0.5), lane.y1},
                                  {static_cast<int>(lane.x2 + lane.width * 0.5), lane.y2},
                                  {static_cast<int>(lane.x2 - lane.width * 0.5), lane.y2}};
    cv::fillConvexPoly(M, corners, 4, cv::Scalar(255.0), 8, 0);
    cv::Mat AM;
    A.copyTo(AM, M);
    const float expected = static_cast<float>(cv::sum(AM)[0]);
    ASSERT_EQ(laneMaskSum(A, lane), expected)
        << "lane " << lane.x1 << "," << lane.y1 << " - " << lane.x2 << "," << lane.y2 << " w "
        << lane.width;
    if (expected != 0.0f) ++tested;
  }
  EXPECT_GT(tested, 300);  // most lanes touch the image
}

}  // namespace
}  // namespace viraduve
