#include <gtest/gtest.h>

#include <opencv2/imgproc.hpp>

#include "export/export_driver.h"
#include "export/overlays.h"

namespace viraduve {
namespace Export {
namespace {

ExportAttributes printSize(uint32_t dpi, float widthCm, float heightCm) {
  ExportAttributes a;
  a.dpi = dpi;
  a.width = widthCm;
  a.height = heightCm;
  return a;
}

TEST(TargetSize, KeepsTheAspectRatioWithinThePrintSize) {
  const struct {
    int cols, rows;
    double width, height;
  } cases[] = {
      {2000, 1000, 1000, 500},  // 10 x 5 cm at 254 dpi
      {1000, 1000, 500, 500},   // height-limited: width follows
      {500, 1000, 250, 500},
  };
  for (const auto& c : cases) {
    const TargetSize t = targetSize(printSize(254, 10.0f, 5.0f), c.rows, c.cols);
    EXPECT_EQ(static_cast<int>(t.width), c.width) << c.cols << "x" << c.rows;
    EXPECT_EQ(static_cast<int>(t.height), c.height) << c.cols << "x" << c.rows;
  }
}

TEST(FontParameters, FollowTheTargetSize) {
  const struct {
    double width, height, fontScale;
    int fontThickness, shapeThickness;
  } cases[] = {
      {1000, 1000, 0.43, 1, 1},
      {300, 300, 0.2, 1, 1},  // the lower bound
      {2000, 2000, 0.86, 2, 2},
      {1500, 1500, 0.645, 1, 2},
  };
  for (const auto& c : cases) {
    const TargetSize t{c.width, c.height};
    const FontParameters f = fontParameters(t);
    EXPECT_DOUBLE_EQ(f.fontScale, c.fontScale) << c.width;
    EXPECT_EQ(f.fontThickness, c.fontThickness) << c.width;
    EXPECT_EQ(shapeLineThickness(t), c.shapeThickness) << c.width;
  }
}

TEST(FrameNameOffset, EachFrameAddsAtLeastTwoAndKeepsTheAspect) {
  CloudFrame inner;
  inner.x1 = 500;
  inner.y1 = 250;
  Offset offset;
  calculateFrameNameOffset(offset, {inner}, {1.0, 1.0}, {1000, 500}, 0.43, 1);
  // 2 on each side, then widened to the 2:1 aspect: 1008 x 504.
  EXPECT_EQ(offset.left, 4);
  EXPECT_EQ(offset.right, 4);
  EXPECT_EQ(offset.top, 2);
  EXPECT_EQ(offset.bottom, 2);

  // A frame at the corner needs room for its name above and left of it.
  CloudFrame corner;
  Offset around;
  calculateFrameNameOffset(around, {corner}, {1.0, 1.0}, {1000, 500}, 0.43, 1);
  int baseline = 0;
  const cv::Size name = cv::getTextSize("F88", cv::FONT_HERSHEY_SIMPLEX, 0.43, 1, &baseline);
  EXPECT_GE(around.left, 5 + name.width + 2);
  EXPECT_GE(around.top, 5 + name.height + 2);
  EXPECT_EQ(around.left, around.right);
  EXPECT_EQ(around.top, around.bottom);
  EXPECT_NEAR((1000.0 + 2 * around.left) / (500.0 + 2 * around.top), 2.0, 0.02);
}

TEST(Markers, LabelSizeAndWeightText) {
  const struct {
    double scale;
    int size;
  } sizes[] = {{0.3, 45}, {0.5599, 45}, {0.56, 11}, {0.8, 30}, {1.1, 11}, {2.0, 11}};
  for (const auto& s : sizes) EXPECT_EQ(markerLabelSize(s.scale), s.size) << s.scale;

  const struct {
    float weight;
    const char* text;
  } texts[] = {{250.0f, "250"}, {-10.0f, "10"}, {12.5f, "12.5"}, {0.7f, "0.7"},
               {3.14159f, "3.142"}, {9.9996f, "10"}, {0.0f, "0"}};
  for (const auto& t : texts) EXPECT_EQ(markerWeightText(t.weight), t.text) << t.weight;
}

int widthAt(const std::string& text, double scale, int thickness) {
  int baseline = 0;
  return cv::getTextSize(text, cv::FONT_HERSHEY_SIMPLEX, scale, thickness, &baseline).width;
}

TEST(TextAnnotationSizeForBox, NarrowsToTheBoxAndAlwaysEnds) {
  Annotation wide;
  wide.text = {"short", "a much longer line of text"};
  wide.x1 = 10;
  wide.x2 = 10 + static_cast<int>(0.7 * widthAt(wide.text[1], 1.0, 1));
  double scale = 1.0;
  textAnnotationSizeForBox(wide, scale, 1);
  EXPECT_LT(scale, 1.0);
  EXPECT_GE(scale, 0.5);
  const int target = static_cast<int>((wide.x2 - wide.x1) - 0.3 * widthAt("A", 1.0, 1));
  EXPECT_LE(std::abs(widthAt(wide.text[1], scale, 1) - target), 2);

  // Narrow already: the downward search cannot reach the box and stops after ten halvings.
  Annotation narrow = wide;
  narrow.x2 = 2000;
  narrow.text = {"W"};
  scale = 1.0;
  textAnnotationSizeForBox(narrow, scale, 1);
  EXPECT_DOUBLE_EQ(scale, 1.0 - 0.5 / 1024);
}

}  // namespace
}  // namespace Export
}  // namespace viraduve
