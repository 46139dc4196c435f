// Frame detection on drawn captures: which route answers, its corner convention, the
// candidate rules of the edge route, de-rotation and the degenerate inputs.
#include <string>
#include <vector>

#include <gtest/gtest.h>
#include <opencv2/imgcodecs.hpp>
#include <opencv2/imgproc.hpp>

#include "framedetect/blobkit/image_exception.h"
#include "framedetect/frame_detection.h"
#include "roi_compare.h"
#include "test_support.h"

namespace {

using viraduve::ImageMode;
using viraduve::ROI;

struct Detection {
  std::vector<ROI> frames;
  std::string log;
  bool edgeRoute() const { return log.find("before filterROI") != std::string::npos; }
};

Detection detect(const cv::Mat& grey, ImageMode mode, float angle = 0.0f) {
  Detection d;
  viraduve::test::StdoutCapture capture;
  viraduve::detectFrames(grey, d.frames, angle, mode);
  d.log = capture.finish();
  return d;
}

// Level `background` with isolated specks one level up, so that Otsu's lower class ends just
// above the background (a clean two-level image would put the split on the background level
// itself and leave no dark class); the specks vanish in the opening.
cv::Mat speckled(int width, int height, int background, const cv::Rect& area = cv::Rect()) {
  cv::Mat m(height, width, CV_8UC1, cv::Scalar(background));
  const cv::Rect r = area.area() > 0 ? area : cv::Rect(0, 0, width, height);
  for (int y = r.y + 5; y < r.y + r.height; y += 10) {
    for (int x = r.x + 5; x < r.x + r.width; x += 10) m.at<uchar>(y, x) = uchar(background + 1);
  }
  return m;
}

cv::Mat membranes(int width, int height, const std::vector<cv::Rect>& rects, int level = 200) {
  cv::Mat m = speckled(width, height, 20);
  for (const auto& r : rects) cv::rectangle(m, r, level, cv::FILLED);
  return m;
}

// A light scan with dark gels (inverted to bright by the visible-light mode).
cv::Mat lightScan(int width, int height, const std::vector<cv::Rect>& gels) {
  cv::Mat m(height, width, CV_8UC1, cv::Scalar(230));
  for (const auto& r : gels) cv::rectangle(m, r, 40, cv::FILLED);
  return m;
}

bool near(const ROI& a, const ROI& b, int tolerance) {
  return std::abs(a.x1 - b.x1) <= tolerance && std::abs(a.y1 - b.y1) <= tolerance &&
         std::abs(a.x2 - b.x2) <= tolerance && std::abs(a.y2 - b.y2) <= tolerance;
}

const std::vector<cv::Rect> kTwoMembranes = {{50, 100, 300, 400}, {450, 100, 300, 400}};

struct RouteCase {
  const char* name;
  ImageMode mode;
  bool blobRoute;
};

class RouteByMode : public ::testing::TestWithParam<RouteCase> {};

TEST_P(RouteByMode, TwoMembranesSideBySide) {
  const cv::Mat capture = membranes(800, 600, kTwoMembranes);
  const cv::Mat original = capture.clone();
  const Detection d = detect(capture, GetParam().mode);
  EXPECT_EQ(cv::norm(capture, original, cv::NORM_INF), 0.0) << "input modified";
  ASSERT_EQ(d.frames.size(), 2u) << d.log;
  if (GetParam().blobRoute) {
    // Right and bottom one past the membrane, in the detector's (raster) order.
    EXPECT_EQ(d.frames[0], (ROI{50, 100, 350, 500}));
    EXPECT_EQ(d.frames[1], (ROI{450, 100, 750, 500}));
    EXPECT_FALSE(d.edgeRoute());
    EXPECT_EQ(d.log.find("After Canny"), std::string::npos);
  } else {
    EXPECT_TRUE(d.edgeRoute());
    EXPECT_TRUE(near(d.frames[0], ROI{50, 100, 349, 499}, 4)) << d.frames[0];
    EXPECT_TRUE(near(d.frames[1], ROI{450, 100, 749, 499}, 4)) << d.frames[1];
  }
}

INSTANTIATE_TEST_SUITE_P(
    Modes, RouteByMode,
    ::testing::Values(RouteCase{"chemi", viraduve::ImageMode_Chemi, true},
                      RouteCase{"fluo", viraduve::ImageMode_Fluo, true},
                      RouteCase{"uv", viraduve::ImageMode_UV, true},
                      RouteCase{"universal", viraduve::ImageMode_Universal, true},
                      // Visible light never takes the blob route, though it would succeed.
                      RouteCase{"vis", viraduve::ImageMode_Vis, false}),
    [](const auto& info) { return std::string(info.param.name); });

TEST(BlobRoute, NoisyMembranes) {
  cv::Mat m = membranes(800, 600, kTwoMembranes);
  cv::Mat noise(m.size(), CV_16SC1);
  cv::randn(noise, 0, 8);
  m.convertTo(m, CV_16SC1);
  m += noise;
  m.convertTo(m, CV_8UC1);
  const Detection d = detect(m, viraduve::ImageMode_Fluo);
  EXPECT_FALSE(d.edgeRoute());
  ASSERT_EQ(d.frames.size(), 2u);
  EXPECT_TRUE(near(d.frames[0], ROI{50, 100, 350, 500}, 2)) << d.frames[0];
  EXPECT_TRUE(near(d.frames[1], ROI{450, 100, 750, 500}, 2)) << d.frames[1];
}

TEST(BlobRoute, CopiesPaddedRowsCorrectly) {
  // A view into a wider matrix: rows are not contiguous.
  cv::Mat wide(700, 1000, CV_8UC1, cv::Scalar(77));
  const cv::Mat capture = membranes(800, 600, kTwoMembranes);
  capture.copyTo(wide(cv::Rect(100, 50, 800, 600)));
  const cv::Mat view = wide(cv::Rect(100, 50, 800, 600));
  ASSERT_FALSE(view.isContinuous());
  EXPECT_EQ(viraduve::detectFramesByBlobs(view), viraduve::detectFramesByBlobs(capture.clone()));
  EXPECT_EQ(viraduve::detectFramesByBlobs(view).size(), 2u);
}

TEST(BlobRoute, DropsBlobsOfOneThirdOfTheLargest) {
  // 60 x 60 = 3600 pixels; 30 x 40 = 1200 = 3600 / 3 is dropped, 31 x 40 = 1240 kept.
  const cv::Mat m = membranes(240, 160, {{10, 10, 60, 60}, {90, 20, 30, 40}, {140, 20, 31, 40}});
  const std::vector<ROI> frames = viraduve::detectFramesByBlobs(m);
  EXPECT_EQ(frames, (std::vector<ROI>{{10, 10, 70, 70}, {140, 20, 171, 60}}));
}

// The left two thirds lie on background 20 (Otsu split 21); the right third on
// 20 + step (split 21 + step), which the right, upper and lower regions see.
cv::Mat unevenBackground(int step) {
  const int w = 300, h = 240;
  cv::Mat m = speckled(w, h, 20);
  speckled(w / 3, h, 20 + step).copyTo(m(cv::Rect(2 * w / 3, 0, w / 3, h)));
  cv::rectangle(m, cv::Rect(w / 6, h / 6, w / 3, 2 * h / 3), 200, cv::FILLED);
  return m;
}

TEST(BlobRoute, DeclinesWhenRegionSplitsDifferBySixLevels) {
  EXPECT_EQ(viraduve::detectFramesByBlobs(unevenBackground(5)),
            (std::vector<ROI>{{50, 40, 150, 200}}));
  EXPECT_TRUE(viraduve::detectFramesByBlobs(unevenBackground(6)).empty());
}

TEST(BlobRoute, DeclinesOnImagesThatAreNotClearlyTwoLevel) {
  // Too little dark: membrane covers all but a thin margin.
  EXPECT_TRUE(viraduve::detectFramesByBlobs(membranes(200, 200, {{4, 4, 192, 192}})).empty());
  // Too little contrast between the classes (meanHigh < meanLow + 64).
  EXPECT_TRUE(viraduve::detectFramesByBlobs(membranes(200, 200, {{50, 50, 100, 100}}, 70)).empty());
  // Largest blob under 5 % of the image.
  EXPECT_TRUE(viraduve::detectFramesByBlobs(membranes(400, 400, {{50, 50, 80, 80}})).empty());
  // Control: the same membrane, large enough.
  EXPECT_EQ(viraduve::detectFramesByBlobs(membranes(400, 400, {{50, 50, 100, 100}})),
            (std::vector<ROI>{{50, 50, 150, 150}}));
}

TEST(EdgeRoute, TwoGelsOnALightScanLogTheirFrames) {
  const Detection d = detect(lightScan(800, 600, kTwoMembranes), viraduve::ImageMode_Vis);
  ASSERT_EQ(d.frames.size(), 2u);
  EXPECT_EQ(d.log.rfind(" --- Frame detection: input image type is 0, width 800, height 600\n"
                        "VIS\n",
                        0),
            0u);
  EXPECT_NE(d.log.find("scale_factor: 0.375\n"), std::string::npos);
  std::string tail = " --- Frame detection: the number of frames after filtering ROI is 2\n";
  for (int i = 0; i < 2; ++i) {
    const ROI& f = d.frames[i];
    tail += "  --- frame " + std::to_string(i + 1) + ": [" + std::to_string(f.x1) + ", " +
            std::to_string(f.y1) + "], [" + std::to_string(f.x2) + ", " + std::to_string(f.y2) +
            "]\n";
  }
  ASSERT_GE(d.log.size(), tail.size());
  EXPECT_EQ(d.log.substr(d.log.size() - tail.size()), tail);
}

struct CandidateCase {
  const char* name;
  cv::Size gel;          // drawn size; at scale 1 the frame measures one more each way
  bool kept;
};

class CandidateRule : public ::testing::TestWithParam<CandidateCase> {};

// 300 x 300 works at scale 1, so the measured sizes are exact: max 285 x 285 (95 %).
TEST_P(CandidateRule, ShapeAndSizeDecide) {
  const cv::Size g = GetParam().gel;
  const Detection d = detect(lightScan(300, 300, {{(300 - g.width) / 2, (300 - g.height) / 2,
                                                   g.width, g.height}}),
                             viraduve::ImageMode_Vis);
  EXPECT_NE(d.log.find("roi_width: " + std::to_string(g.width + 1) + "\nroi_height: " +
                       std::to_string(g.height + 1) + "\nmax_width: 285\nmax_height: 285\n"),
            std::string::npos)
      << d.log;
  ASSERT_EQ(d.frames.size(), 1u);
  const bool wholeImage = d.frames[0] == ROI{0, 0, 299, 299};
  EXPECT_EQ(!wholeImage, GetParam().kept) << d.frames[0];
  EXPECT_EQ(d.log.find("valid contour") != std::string::npos, GetParam().kept);
}

INSTANTIATE_TEST_SUITE_P(
    Cases, CandidateRule,
    ::testing::Values(
        // 60 / 200 is 0.3 exactly: the shape test is strict.
        CandidateCase{"ratio30", {199, 59}, false}, CandidateCase{"ratio305", {199, 60}, true},
        // 96 % both ways is the capture's own edge; 96 % x 90 % is a frame.
        CandidateCase{"w96h96", {287, 287}, false}, CandidateCase{"w96h90", {287, 269}, true},
        CandidateCase{"w95h95", {284, 284}, false}, CandidateCase{"w94h94", {283, 283}, true}),
    [](const auto& info) { return std::string(info.param.name); });

TEST(EdgeRoute, WholeImageWhenNothingIsFound) {
  struct Case {
    cv::Mat image;
    ImageMode mode;
    ROI expected;
  };
  const std::vector<Case> cases = {
      {cv::Mat(600, 800, CV_8UC1, cv::Scalar(100)), viraduve::ImageMode_Vis, {0, 0, 799, 599}},
      {cv::Mat(600, 800, CV_8UC1, cv::Scalar(100)), viraduve::ImageMode_Chemi, {0, 0, 799, 599}},
      {cv::Mat(1, 1, CV_8UC1, cv::Scalar(7)), viraduve::ImageMode_Vis, {0, 0, 0, 0}},
      {cv::Mat(2, 2, CV_8UC1, cv::Scalar(7)), viraduve::ImageMode_Fluo, {0, 0, 1, 1}},
      {cv::Mat(3, 1, CV_8UC1, cv::Scalar(7)), viraduve::ImageMode_Vis, {0, 0, 0, 2}},
  };
  for (const Case& c : cases) {
    const Detection d = detect(c.image, c.mode);
    EXPECT_EQ(d.frames, std::vector<ROI>{c.expected}) << c.image.size();
  }
}

TEST(FrameDetection, ImagesOfOneRowOrColumnRaise) {
  // The blob route's thirds of a 1-pixel side are empty regions.
  EXPECT_THROW(detect(cv::Mat(1, 1, CV_8UC1, cv::Scalar(7)), viraduve::ImageMode_Fluo),
               blobkit::imageException);
  EXPECT_THROW(detect(cv::Mat(40, 1, CV_8UC1, cv::Scalar(7)), viraduve::ImageMode_Chemi),
               blobkit::imageException);
  // Scaled to 300 on the long side, the short side truncates to 0 pixels.
  EXPECT_THROW(detect(cv::Mat(1, 500, CV_8UC1, cv::Scalar(7)), viraduve::ImageMode_Vis),
               cv::Exception);
}

TEST(EdgeRoute, DerotatesOnlyAboveHalfADegree) {
  // A 400 x 300 gel turned by 10 degrees; the frames of a de-rotated image stay in its
  // (rotated) coordinates.
  cv::Mat m(600, 800, CV_8UC1, cv::Scalar(230));
  const cv::RotatedRect turned(cv::Point2f(400, 300), cv::Size2f(400, 300), 10);
  cv::Point2f corners[4];
  turned.points(corners);
  const std::vector<cv::Point> polygon(corners, corners + 4);
  cv::fillConvexPoly(m, polygon, cv::Scalar(40));

  const Detection straight = detect(m, viraduve::ImageMode_Vis, 0.0f);
  const Detection half = detect(m, viraduve::ImageMode_Vis, 0.5f);
  const Detection above = detect(m, viraduve::ImageMode_Vis, 0.51f);
  const Detection derotated = detect(m, viraduve::ImageMode_Vis, 10.0f);
  ASSERT_EQ(straight.frames.size(), 1u);
  EXPECT_EQ(half.frames, straight.frames);
  EXPECT_NE(above.frames, straight.frames);
  EXPECT_NE(derotated.log.find("ratation_angle: 10 degree\n"), std::string::npos);

  // Without de-rotation the frame is the turned gel's bounding box (about 446 x 365); with
  // it, close to the gel itself.
  const ROI& s = straight.frames[0];
  EXPECT_GT(s.x2 - s.x1, 430);
  ASSERT_EQ(derotated.frames.size(), 1u);
  const ROI& r = derotated.frames[0];
  EXPECT_NEAR(r.x2 - r.x1, 400, 25) << r;
  EXPECT_NEAR(r.y2 - r.y1, 300, 25) << r;
  // Turning the other way doubles the skew instead.
  const ROI wrong = detect(m, viraduve::ImageMode_Vis, -10.0f).frames.at(0);
  EXPECT_GT(wrong.x2 - wrong.x1, 450) << wrong;
}

TEST(FrameDetection, UndecodableImageLeavesTheListAlone) {
  const std::vector<ROI> before{{1, 2, 3, 4}};
  for (const auto& bytes : {std::vector<unsigned char>{}, std::vector<unsigned char>{1, 2, 3}}) {
    std::vector<ROI> frames = before;
    viraduve::test::StdoutCapture capture;
    viraduve::detectFrames(bytes, frames, 0.0f, viraduve::ImageMode_Vis);
    EXPECT_EQ(capture.finish(),
              " --- Frame detection: input image type is 0, width 0, height 0\n"
              "VIS\n"
              "image is not found\n\n");
    EXPECT_EQ(frames, before);
  }
}

TEST(FrameDetection, EncodedBytesGiveTheSameFramesAsTheMatrix) {
  const cv::Mat m = membranes(800, 600, kTwoMembranes);
  std::vector<unsigned char> png;
  ASSERT_TRUE(cv::imencode(".png", m, png));
  std::vector<ROI> fromBytes{{9, 9, 9, 9}};
  viraduve::test::StdoutCapture capture;
  viraduve::detectFrames(png, fromBytes, 0.0f, viraduve::ImageMode_Fluo);
  capture.finish();
  EXPECT_EQ(fromBytes, detect(m, viraduve::ImageMode_Fluo).frames);
}

TEST(RotateImage, GrowsToTheRotatedExtentWithWhiteCorners) {
  const cv::Mat src(100, 200, CV_8UC1, cv::Scalar(0));
  cv::Mat dst;
  viraduve::rotateImage(src, dst, 0.0f, 1);
  // d = trunc(sqrt(100^2 + 200^2)) = 223; the unrotated crop is the source itself.
  EXPECT_EQ(dst.size(), src.size());
  EXPECT_EQ(cv::countNonZero(dst), 0);

  viraduve::rotateImage(src, dst, 30.0f, 1);
  // |cos|, |sin| of 30 degrees: about 223 x 186, white where the source does not reach.
  EXPECT_NEAR(dst.cols, 223, 2);
  EXPECT_NEAR(dst.rows, 186, 2);
  EXPECT_EQ(dst.at<uchar>(0, 0), 255);
  EXPECT_EQ(dst.at<uchar>(dst.rows / 2, dst.cols / 2), 0);

  cv::Mat inPlace = src.clone();
  viraduve::rotateImage(inPlace, inPlace, 30.0f, 0);
  EXPECT_EQ(inPlace.size(), dst.size());
  EXPECT_EQ(cv::countNonZero(inPlace), 0);
}

TEST(ComputeFrameAngles, WeightsEdgesByLengthAndIgnoresBorders) {
  // Edges 0->1 (slope -0.1 over 100), 1->2 steep (skipped), 2->3 on the bottom border
  // (skipped), 3->0 steep.
  const std::vector<std::vector<cv::Point>> hulls = {
      {{10, 20}, {110, 10}, {110, 99}, {10, 99}},
      {{0, 0}, {0, 50}},  // both edges on the left border: no usable edge
  };
  viraduve::test::StdoutCapture capture;
  const std::vector<float> angles = viraduve::computeFrameAngles(hulls, {200, 100}, 0.34906584f);
  const std::string log = capture.finish();
  ASSERT_EQ(angles.size(), 2u);
  EXPECT_FLOAT_EQ(angles[0], std::atan(-0.1f));
  EXPECT_TRUE(std::isnan(angles[1]));
  EXPECT_EQ(log.rfind("Computed rotate angle for each frame:\nframe[0], angle: -0.100\nframe[1], "
                      "angle: ",
                      0),
            0u)
      << log;
}

}  // namespace
