// Region measures: rectangles as band boxes, circles with their own local background and
// per-pixel truncation, purities per channel, and the global background of each form.
#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <random>

#include "detector/BandLaneDetectionImpl.h"
#include "detector/regions.h"
#include "pipeline/ImageProcessing.h"
#include "test_support.h"

namespace viraduve {
namespace {

Region2D circleAt(uint32_t channel, uint32_t x, uint32_t y, uint32_t radius) {
  Region2D r;
  r.channel = channel, r.circle_b = true, r.x = x, r.y = y, r.circle_radius = radius;
  return r;
}

Region2D rectAt(uint32_t channel, uint32_t x1, uint32_t y1, uint32_t x2, uint32_t y2) {
  Region2D r;
  r.channel = channel, r.x1 = x1, r.y1 = y1, r.x2 = x2, r.y2 = y2;
  return r;
}

// The circle measurement written out over every pixel of the image, in row-major order.
Region2D literalCircle(const cv::Mat& A, const cv::Mat& T, double G, Region2D r) {
  auto inside = [&](int row, int col, double radius) {
    return (col - double(r.x)) * (col - double(r.x)) + (row - double(r.y)) * (row - double(r.y)) <
           radius * radius;
  };
  double localSum = 0;
  int localCount = 0;
  for (int row = 0; row < A.rows; ++row)
    for (int col = 0; col < A.cols; ++col)
      if (inside(row, col, r.circle_radius + 5.0)) localSum += A.at<float>(row, col), ++localCount;
  const double bLoc = localSum / localCount;
  std::vector<float> values;
  r.volume = r.global_bg_volume = r.local_bg_volume = r.rolling_bg_volume = 0;
  for (int row = 0; row < A.rows; ++row)
    for (int col = 0; col < A.cols; ++col)
      if (inside(row, col, r.circle_radius)) {
        const float a = A.at<float>(row, col);
        r.volume += a;
        r.global_bg_volume += std::max(0, static_cast<int>(a - G));
        r.local_bg_volume += std::max(0, static_cast<int>(a - bLoc));
        r.rolling_bg_volume += T.at<float>(row, col);
        values.push_back(a);
      }
  r.area = static_cast<double>(values.size());
  std::sort(values.begin(), values.end());
  r.median_intensity = values.empty() ? 0.0 : values[values.size() / 2];
  return r;
}

TEST(CircleRegion, BoundingBoxVisitEqualsAFullScan) {
  std::mt19937 rng(5);
  cv::Mat A(47, 61, CV_32FC1), T(47, 61, CV_32FC1);
  cv::randu(A, 0.0, 65535.0);
  cv::randu(T, 0.0, 3000.0);
  std::uniform_int_distribution<int> centre(0, 80), radius(0, 40);
  for (int trial = 0; trial < 150; ++trial) {
    Region2D got = circleAt(0, centre(rng), centre(rng), radius(rng));
    const Region2D want = literalCircle(A, T, 30000.5, got);
    measureCircleRegion(A, T, 30000.5, got);
    const double g[] = {got.area, got.volume, got.local_bg_volume, got.global_bg_volume,
                        got.rolling_bg_volume, got.median_intensity};
    const double w[] = {want.area, want.volume, want.local_bg_volume, want.global_bg_volume,
                        want.rolling_bg_volume, want.median_intensity};
    for (int i = 0; i < 6; ++i) ASSERT_EQ(g[i], w[i]) << trial << " measure " << i;
    if (got.area > 0) EXPECT_EQ(got.density, got.volume / got.area);
    else EXPECT_TRUE(std::isnan(got.density));  // no pixel: 0 / 0, answered as 0
  }
}

TEST(Regions, RectangleAndCircleOverTheSamePixel) {
  cv::Mat A(40, 40, CV_32FC1, cv::Scalar(100)), T(40, 40, CV_32FC1, cv::Scalar(3));
  A.at<float>(20, 20) = 1000;
  T.at<float>(20, 20) = 900;
  std::vector<Region2D> regions = {rectAt(0, 20, 20, 20, 20), circleAt(0, 20, 20, 1)};
  measureRegions(A, T, 100.0, 0, regions);
  const Region2D& rect = regions[0];
  const Region2D& circle = regions[1];
  EXPECT_EQ(circle.area, 1.0);  // radius 1 holds the centre alone
  EXPECT_EQ(rect.volume, circle.volume);
  EXPECT_EQ(rect.rolling_bg_volume, circle.rolling_bg_volume);
  // The rectangle's frame is background only; the circle's disc of radius 6 (109 pixels)
  // includes the bright pixel, so its local correction is smaller.
  EXPECT_EQ(rect.local_bg_volume, 900.0);
  EXPECT_EQ(circle.local_bg_volume, static_cast<int>(1000 - (100 + 900.0 / 109)));
}

TEST(Regions, TruncationAndPurity) {
  // 0.9 above the global background: nothing in a circle (whole numbers per pixel), 0.9 per
  // pixel in a rectangle.
  const cv::Mat flat(30, 30, CV_32FC1, cv::Scalar(100.9)), zero = cv::Mat::zeros(30, 30, CV_32FC1);
  std::vector<Region2D> r = {circleAt(0, 15, 15, 1), rectAt(0, 15, 15, 15, 15)};
  measureRegions(flat, zero, 100.0, 0, r);
  EXPECT_EQ(r[0].global_bg_volume, 0.0);
  EXPECT_NEAR(r[1].global_bg_volume, 0.9, 1e-5);
  EXPECT_EQ(r[0].purity, 0.0);  // no local signal anywhere: 0, not NaN
  EXPECT_EQ(r[1].purity, 0.0);

  cv::Mat A(40, 40, CV_32FC1, cv::Scalar(10));
  A(cv::Rect(5, 5, 3, 3)).setTo(110);    // 9 pixels 100 above their frame
  A(cv::Rect(20, 20, 3, 1)).setTo(310);  // 3 pixels 300 above
  std::vector<Region2D> shares = {rectAt(0, 5, 5, 7, 7), rectAt(0, 20, 20, 22, 20),
                                  rectAt(1, 5, 5, 7, 7)};
  shares[2].purity = 7.0;
  measureRegions(A, cv::Mat::zeros(40, 40, CV_32FC1), 10.0, 0, shares);
  EXPECT_NEAR(shares[0].purity, 0.5, 1e-7);
  EXPECT_NEAR(shares[1].purity, 0.5, 1e-7);
  EXPECT_EQ(shares[2].purity, 7.0);  // another channel
}

TEST(Regions, GlobalBackgroundOfEachForm) {
  cv::Mat m(30, 30, CV_16UC1, cv::Scalar(200));
  m.colRange(0, 10).setTo(100);
  m.at<ushort>(15, 20) = 1200;
  test::TempDir dir;
  test::writeImage(dir.file("ch0.tif"), m);
  const std::vector<ImageParam> params(1);
  auto measured = [&](int kind) {
    std::vector<Region2D> r = {rectAt(0, 20, 15, 20, 15)};
    if (kind == 0) ImageProcessing::runRegionAnalysis(dir.path(), r, params, ImageMode_Protein);
    if (kind == 1) ImageProcessing::runRegionAnalysisRectBackground(dir.path(), r, params, ImageMode_Protein, ROI{0, 0, 9, 29});
    if (kind == 2) ImageProcessing::runRegionAnalysisCircleBackground(dir.path(), r, params, ImageMode_Protein, Circle{5, 5, 3});
    return r[0].global_bg_volume;
  };
  EXPECT_EQ(measured(0), 1000.0);  // whole image: near-median 200
  EXPECT_EQ(measured(1), 1100.0);  // the left strip: 100
  EXPECT_EQ(measured(2), 1100.0);

  // The region forms log nothing between their entry and exit lines.
  Image image;
  image.setMat(m);
  std::vector<Region2D> r = {circleAt(0, 20, 15, 2)};
  test::StdoutCapture out;
  BandLaneDetectionImpl().analyis(image, r, 0, ROI{0, 0, 29, 29}, 30);
  EXPECT_EQ(out.finish(),
            "In BandLaneDetectionImpl::analyis().\nOut BandLaneDetectionImpl::analyis().\n");
}

}  // namespace
}  // namespace viraduve
