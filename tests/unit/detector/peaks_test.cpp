#include <gtest/gtest.h>

#include <utility>
#include <vector>

#include "detector/BandLaneDetectionImpl.h"

namespace viraduve {
namespace {

std::vector<std::pair<int, float>> peaksOf(const std::vector<float>& samples, bool asColumn) {
  cv::Mat profile = cv::Mat(samples, true).reshape(1, 1);
  if (asColumn) profile = profile.t();
  std::vector<Peak> peaks;
  BandLaneDetectionImpl::findPeaks(profile, peaks);
  std::vector<std::pair<int, float>> result;
  for (const Peak& p : peaks) result.emplace_back(p.position, p.value);
  return result;
}

// Each peak is reported one sample after the stored turn index, with the value at that index
// (the sample left of the reported position).
TEST(FindPeaks, PositionsAndValues) {
  const struct {
    const char* name;
    std::vector<float> samples;
    std::vector<std::pair<int, float>> peaks;
  } cases[] = {
      {"constant", {0.5f, 0.5f, 0.5f, 0.5f}, {}},
      {"increasing", {0, 1, 2, 3, 4}, {}},
      {"decreasing", {4, 3, 2, 1}, {}},
      {"single sample", {1}, {}},
      {"valley only", {3, 1, 0, 1, 3}, {}},
      {"single hump", {0, 1, 2, 5, 2, 1, 0}, {{3, 2.0f}}},
      {"two humps", {0, 1, 3, 1, 0, 0, 2, 6, 2, 0}, {{2, 1.0f}, {7, 2.0f}}},
      // Kept indices 0, 3, 4, 5: the plateau counts once, the turn is at index 3.
      {"plateau", {0, 1, 1, 1, 4, 0}, {{4, 1.0f}}},
      // Range 1000, cut 1.0: the inner ripple turn (position 7) has a prominence equal to the
      // ripple height, 0.5 (dropped) or 3 (kept).
      {"ripple 0.5", {0, 500, 1000, 500, 100, 100.5f, 100, 100.5f, 100, 100.5f, 100, 50, 0},
       {{2, 500.0f}, {5, 100.0f}, {9, 100.0f}}},
      {"ripple 3", {0, 500, 1000, 500, 100, 103, 100, 103, 100, 103, 100, 50, 0},
       {{2, 500.0f}, {5, 100.0f}, {7, 100.0f}, {9, 100.0f}}},
  };
  for (const auto& c : cases) {
    EXPECT_EQ(peaksOf(c.samples, false), c.peaks) << c.name;
    EXPECT_EQ(peaksOf(c.samples, true), c.peaks) << c.name << " (column)";
  }
}

TEST(FindPeaks, MatrixWithRowsAndColumnsHasNoPeaks) {
  cv::Mat m = cv::Mat::zeros(3, 5, CV_32F);
  m.at<float>(1, 2) = 1.0f;
  std::vector<Peak> peaks = {Peak{1, 1.0f}};
  BandLaneDetectionImpl::findPeaks(m, peaks);
  EXPECT_TRUE(peaks.empty());
  BandLaneDetectionImpl::findPeaks(cv::Mat(), peaks);
  EXPECT_TRUE(peaks.empty());
}

}  // namespace
}  // namespace viraduve
