#include <gtest/gtest.h>

#include <opencv2/core.hpp>

#include "export/colours.h"

namespace viraduve {
namespace Export {
namespace {

TEST(HexToScalar, TableLookupIsExactAndUpperCase) {
  const struct {
    const char* text;
    cv::Scalar bgr;
  } cases[] = {
      {"#44BBFF", {255, 187, 68}},
      {"#44bbff", {8, 191, 250}},  // not in the table: the default "#FABF08"
      {"#000000", {13, 13, 13}},   // black is lifted so it stays visible
      {"#FFFFFF", {255, 255, 255}},
      {"#25E4A4", {164, 228, 37}},
      {"#123456", {8, 191, 250}},
      {"", {8, 191, 250}},
      {"#18FFFF ", {8, 191, 250}},
  };
  for (const auto& c : cases) EXPECT_EQ(hexToScalar(c.text), c.bgr) << '"' << c.text << '"';
}

// A picture with the given number of dark (0) and bright (255) pixels out of 100.
cv::Mat darkAndBright(int darkPercent) {
  cv::Mat picture(10, 10, CV_8UC3, cv::Scalar::all(255));
  for (int i = 0; i < darkPercent; ++i) picture.at<cv::Vec3b>(i / 10, i % 10) = cv::Vec3b(0, 0, 0);
  return picture;
}

TEST(IsDarkPicture, NeedsAMarginOfATenthOfThePixels) {
  EXPECT_FALSE(isDarkPicture(darkAndBright(55)));
  EXPECT_TRUE(isDarkPicture(darkAndBright(56)));
  EXPECT_TRUE(isDarkPicture(darkAndBright(100)));
  EXPECT_FALSE(isDarkPicture(darkAndBright(0)));
  // 128 is not above the threshold: it counts as dark.
  EXPECT_TRUE(isDarkPicture(cv::Mat(4, 4, CV_8UC3, cv::Scalar::all(128))));
  EXPECT_FALSE(isDarkPicture(cv::Mat(4, 4, CV_8UC3, cv::Scalar::all(129))));
}

}  // namespace
}  // namespace Export
}  // namespace viraduve
