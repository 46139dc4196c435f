// Total-protein normalisation: the lane totals and factors, the division of the band
// measures, the settings from "tpn.cfg", and the pairing of the request with the frames.
#include <gtest/gtest.h>

#include <filesystem>
#include <fstream>
#include <random>
#include <sstream>

#include <opencv2/imgproc.hpp>

#include "api/tpn_request.h"
#include "detector/BandLaneDetectionImpl.h"
#include "detector/normalization.h"
#include "pipeline/ImageProcessing.h"
#include "pipeline/tpn_config.h"
#include "test_support.h"
#include "viraduve/Exception.h"

namespace viraduve {
namespace {

Lane2D laneAt(int x1, int y1, int x2, int y2, int width) {
  Lane2D l;
  l.x1 = x1, l.y1 = y1, l.x2 = x2, l.y2 = y2, l.width = width;
  return l;
}

struct Totals {
  std::vector<std::vector<double>> factor, volume, background, adjusted;
  bool operator==(const Totals& o) const {
    return factor == o.factor && volume == o.volume && background == o.background &&
           adjusted == o.adjusted;
  }
};

Totals measure(const cv::Mat& m, const std::vector<VerticalRange>& ranges,
               std::vector<std::vector<Lane2D>> lanes, int radius, double ratio) {
  Totals t;
  Image image;
  image.setMat(m);
  BandLaneDetectionImpl().computeAllNormFactor(image, ranges, lanes, radius, ratio, t.factor,
                                               t.volume, t.background, t.adjusted);
  return t;
}

// 100 x 60: stripes of 1000 (columns 15..25) and 500 (40..50), narrower than the opening of
// radius 10, so wholly above background; a plateau of 800 (70..99) that the opening keeps.
cv::Mat stripesAndPlateau() {
  cv::Mat m = cv::Mat::zeros(60, 100, CV_16UC1);
  m.colRange(15, 26).setTo(1000);
  m.colRange(40, 51).setTo(500);
  m.colRange(70, 100).setTo(800);
  return m;
}

TEST(TotalProteinMeasure, FactorsScalingAndDegenerateLanes) {
  // Rows 10..49, 11 columns: 440 pixels per mask. The lane at x 500 has an empty mask: factor
  // 1.0 and no volume, not an infinite scale. The lane of width 4 (5 columns) is scaled up.
  const Totals t = measure(stripesAndPlateau(), {{10, 49}, {100, 120}},
                           {{laneAt(20, 0, 20, 59, 10), laneAt(45, 0, 45, 59, 10),
                             laneAt(85, 0, 85, 59, 10), laneAt(500, 0, 500, 59, 10),
                             laneAt(20, 0, 20, 59, 4)},
                            {laneAt(20, 0, 20, 59, 10)}},
                           10, 1.0);
  const double volume[] = {440000, 220000, 352000, 0, 440000};
  const double adjusted[] = {440000, 220000, 0, 0, 440000};
  const double factor[] = {1.0, 0.5, 1.0, 1.0, 1.0};  // no signal above background: 1.0
  for (int i = 0; i < 5; ++i) {
    EXPECT_NEAR(t.volume[0][i], volume[i], 0.1) << i;  // S is rounded through 1/65535
    EXPECT_NEAR(t.adjusted[0][i], adjusted[i], 0.1) << i;
    EXPECT_NEAR(t.background[0][i], volume[i] - adjusted[i], 0.1) << i;
    EXPECT_NEAR(t.factor[0][i], factor[i], 1e-6) << i;
  }
  // A range below the image empties the one lane of the second frame.
  EXPECT_EQ(t.factor[1], std::vector<double>{1.0});
  EXPECT_EQ(t.volume[1], std::vector<double>{0.0});

  // A lane without height counts as vertical at its top; a tilted lane is followed.
  EXPECT_TRUE(measure(stripesAndPlateau(), {{10, 49}}, {{laneAt(20, 30, 90, 30, 10)}}, 10, 1) ==
              measure(stripesAndPlateau(), {{10, 49}}, {{laneAt(20, 0, 20, 59, 10)}}, 10, 1));
  const Totals tilted = measure(cv::Mat(60, 100, CV_16UC1, cv::Scalar(100)), {{10, 30}},
                                {{laneAt(20, 0, 40, 40, 20)}}, 0, 0.5);
  cv::Mat mask = cv::Mat::zeros(60, 100, CV_8U);
  const cv::Point poly[4] = {{20, 10}, {30, 10}, {40, 30}, {30, 30}};  // centre 25 -> 35, half 5
  cv::fillConvexPoly(mask, poly, 4, cv::Scalar(255), 8, 0);
  EXPECT_NEAR(tilted.volume[0][0], 100.0 * cv::countNonZero(mask), 1e-2);
}

// The sums over the polygon's clipped bounding box against a literal image-size mask, for
// strips inside, across and outside the borders. cv::sum adds float pairs before widening,
// so the sums agree to about 1e-9 while the pixels must be the same.
TEST(TotalProteinMeasure, BoundingBoxSumsEqualTheImageSizeMask) {
  std::mt19937 rng(11);
  cv::Mat A(57, 83, CV_32FC1), B(57, 83, CV_32FC1);
  cv::randu(A, 0.0, 65535.0);
  cv::randu(B, 0.0, 1000.0);
  std::uniform_int_distribution<int> coord(-40, 130);
  std::uniform_real_distribution<double> half(0.0, 25.0);
  for (int trial = 0; trial < 400; ++trial) {
    const int y1 = coord(rng), y2 = coord(rng), xt = coord(rng), xb = coord(rng);
    const double h = half(rng);
    const cv::Point poly[4] = {{static_cast<int>(xt - h), y1}, {static_cast<int>(xt + h), y1},
                               {static_cast<int>(xb + h), y2}, {static_cast<int>(xb - h), y2}};
    cv::Mat mask = cv::Mat::zeros(A.size(), CV_8U), am, bm;
    cv::fillConvexPoly(mask, poly, 4, cv::Scalar(255.0), 8, 0);
    A.copyTo(am, mask);
    B.copyTo(bm, mask);
    const PolygonSums sums = sumInsideConvexPolygon(A, B, poly);
    ASSERT_EQ(sums.pixels, cv::countNonZero(mask)) << trial;
    ASSERT_NEAR(sums.sumA, cv::sum(am)[0], 1e-7 * (1 + sums.sumA)) << trial;
    ASSERT_NEAR(sums.sumB, cv::sum(bm)[0], 1e-7 * (1 + sums.sumB)) << trial;
  }
}

TEST(ApplyNormalization, DividesEveryMeasureAndRefusesBadFactorsFirst) {
  Band2D b;
  double* raw[] = {&b.volume, &b.density, &b.local_bg_volume, &b.local_bg_density,
                   &b.global_bg_volume, &b.global_bg_density, &b.rolling_bg_volume,
                   &b.rolling_bg_density, &b.lane_bg_volume, &b.lane_bg_density};
  for (int i = 0; i < 10; ++i) *raw[i] = (i + 1) * 10;
  Lane2D lane, empty;
  lane.bands = {b};
  ImageProcessing::LanesPerFrame frames{{lane, empty, lane}};
  ImageProcessing::applyNormalization(frames, {{0.5, 3.0, 2.0}});
  const Band2D& n = frames[0][0].bands[0];
  const double norm[] = {n.volume_norm, n.density_norm, n.local_bg_volume_norm,
                         n.local_bg_density_norm, n.global_bg_volume_norm,
                         n.global_bg_density_norm, n.rolling_bg_volume_norm,
                         n.rolling_bg_density_norm, n.lane_bg_volume_norm, n.lane_bg_density_norm};
  for (int i = 0; i < 10; ++i) EXPECT_EQ(norm[i], (i + 1) * 20.0) << i;
  EXPECT_EQ(frames[0][2].bands[0].volume_norm, 5.0);

  struct Case {
    ImageProcessing::LanesPerFrame frames;
    std::vector<std::vector<double>> factors;
  } bad[] = {{{{lane}}, {{1.0}, {1.0}}},           // frame counts differ
             {{{lane}, {lane}}, {{1.0}, {0.0}}},   // a factor of 0 in the second frame
             {{{lane}, {lane}}, {{2.0}, {-1.0}}}};
  for (Case& c : bad) {
    try {
      ImageProcessing::applyNormalization(c.frames, c.factors);
      ADD_FAILURE() << "accepted";
    } catch (const Exception& e) {
      EXPECT_EQ(e.code, -7);
    }
    EXPECT_EQ(c.frames[0][0].bands[0].volume_norm, 0.0);  // nothing changed
  }
  ImageProcessing::LanesPerFrame longer{{lane, lane}};
  EXPECT_THROW(ImageProcessing::applyNormalization(longer, {{1.0}}), std::out_of_range);
}

// 2704 / (3 * 184) pixels per mm: binning 3 at optical zoom 1.
constexpr double kResolution = 2704.0 / 552.0;

TEST(TpnSettings, DefaultsAndConfigurationLines) {
  double resolution = 0, shortMm = 0;
  // 4 mm is 19.6 pixels, rounded to 20; a quarter of a 60-pixel short side is 15.
  EXPECT_EQ(defaultTpnSettings(60, 100, 1.0, 3, resolution, shortMm).rbRadius, 15);
  EXPECT_EQ(defaultTpnSettings(1000, 800, 1.0, 3, resolution, shortMm).rbRadius, 20);
  EXPECT_DOUBLE_EQ(resolution, kResolution);
  EXPECT_THROW(defaultTpnSettings(1000, 800, 1.0, 0, resolution, shortMm), Exception);

  const double shortSide = 60 / kResolution;  // 12.25 mm
  const struct {
    const char* line;
    int radius;
    double ratio;
  } cases[] = {
      {"band lane width (in %) = 25", 15, 0.25},
      {"band lane width (in %)=100", 15, 1.0},
      {"# band lane width (in %) is = 50 percent", 15, 0.5},
      {"band lane width (in %) = 24", 15, 0.9},
      {"band lane width (in %) = 101", 15, 0.9},
      {"= 50 band lane width (in %)", 15, 0.9},
      {"Band Lane Width (in %) = 50", 15, 0.9},
      {"rolling ball size (in mm) = 3.5", 17, 0.9},  // 17.1 pixels
      {"rolling ball size (in mm) = 12", 59, 0.9},   // no quarter-side cap
      {"rolling ball size (in mm) = 0", 15, 0.9},
      {"rolling ball size (in mm) = 12.3", 15, 0.9},
  };
  for (const auto& c : cases) {
    TpnSettings s{15, 0.9};
    applyTpnConfigLine(c.line, shortSide, kResolution, s);
    EXPECT_EQ(s.rbRadius, c.radius) << c.line;
    EXPECT_EQ(s.widthRatio, c.ratio) << c.line;
  }
  std::istringstream file("band lane width (in %) = 40\r\nrolling ball size (in mm) = 2\n"
                          "band lane width (in %) = 60\nband lane width (in %) = 200\n");
  TpnSettings s{15, 0.9};
  readTpnConfig(file, shortSide, kResolution, s);
  EXPECT_EQ(s.widthRatio, 0.6);
  EXPECT_EQ(s.rbRadius, 10);
}

// Stripes 25 columns wide: kept by the opening of radius 10, removed by that of radius 15.
cv::Mat stripes() {
  cv::Mat m = cv::Mat::zeros(60, 100, CV_16UC1);
  m.colRange(10, 35).setTo(4000);
  m.colRange(60, 85).setTo(1000);
  return m;
}

TEST(TpnDriver, SettingsComeFromTheCurrentFolderAndTheChannelIsOriented) {
  test::TempDir capture;
  test::writeImage(capture.file("ch0.tif"), cv::Scalar(65535) - stripes());  // bright background
  const std::vector<std::vector<Lane2D>> lanes = {
      {laneAt(22, 0, 22, 59, 20), laneAt(72, 0, 72, 59, 20)}};
  auto driver = [&](const char* config) {
    test::TempDir folder;
    if (config != nullptr) std::ofstream(folder.file("tpn.cfg")) << config;
    const std::filesystem::path saved = std::filesystem::current_path();
    std::filesystem::current_path(folder.path());
    Totals t;
    auto l = lanes;
    ImageProcessing::computeAllNormFactor(capture.path(), ImageMode_Vis, std::vector<ImageParam>(1),
                                          0, {{5, 54}}, l, t.factor, t.volume, t.background,
                                          t.adjusted, 1.0, 1.0, 3);
    std::filesystem::current_path(saved);
    return t;
  };
  const Totals defaults = measure(stripes(), {{5, 54}}, lanes, 15, 0.9);
  ASSERT_FALSE(defaults == measure(stripes(), {{5, 54}}, lanes, 10, 0.5));
  EXPECT_TRUE(driver(nullptr) == defaults);
  EXPECT_TRUE(driver("") == defaults);
  // 2 mm is 9.8 pixels, rounded to 10.
  EXPECT_TRUE(driver("band lane width (in %) = 50\nrolling ball size (in mm) = 2\n") ==
              measure(stripes(), {{5, 54}}, lanes, 10, 0.5));
}

TEST(TpnRequest, WorkingFramesRepeatLanesNamedTwiceAndSkipUnnamedOnes) {
  const ROI frame{0, 0, 99, 99};
  const std::vector<Lane2D> lanes = {laneAt(10, 0, 10, 99, 5), laneAt(20, 0, 20, 99, 5),
                                     laneAt(30, 0, 30, 99, 5)};
  auto request = [](const ROI& r, std::vector<Lane2D> named) {
    api::TpnFrame f;
    f.analysisFrameRoi = {uint32_t(r.x1), uint32_t(r.x2), uint32_t(r.y1), uint32_t(r.y2)};
    for (const Lane2D& l : named) {
      f.normalizeLanes.push_back({"", {uint32_t(l.x1), uint32_t(l.x2), uint32_t(l.y1), uint32_t(l.y2)}});
    }
    return f;
  };
  const auto working = api::buildWorkingFrames(
      {frame}, {lanes},
      {request(frame, {lanes[2], lanes[0], lanes[0]}), request(ROI{0, 0, 99, 98}, {lanes[0]})});
  ASSERT_EQ(working.size(), 2u);
  ASSERT_EQ(working[0].size(), 3u);  // in the frame's lane order
  EXPECT_EQ(working[0][0].x1, 10);
  EXPECT_EQ(working[0][1].x1, 10);
  EXPECT_EQ(working[0][2].x1, 30);
  EXPECT_TRUE(working[1].empty());
}

}  // namespace
}  // namespace viraduve
