// Small steps that several detection stages share: integer medians, edge lists from profile
// peaks, and the profile clean-up that keeps only what rises above half the mean.
#pragma once

#include <algorithm>
#include <cmath>
#include <vector>

#include <opencv2/core.hpp>

#include "detector/BandLaneDetectionImpl.h"

namespace viraduve {

// Median of integers: sorted ascending, the middle one, or for an even count the two middle
// ones summed and halved in integer division. 0 for an empty list.
inline int integerMedian(std::vector<int> values) {
  if (values.empty()) return 0;
  std::sort(values.begin(), values.end());
  const std::size_t n = values.size();
  if (n % 2 == 1) return values[n / 2];
  return (values[n / 2 - 1] + values[n / 2]) / 2;
}

// Top edges (+1) and bottom edges (-1) merged and ordered by position; at equal positions the
// top edge comes first, so the order never depends on the sort algorithm.
inline std::vector<Edge> mergeEdges(const std::vector<Peak>& tops,
                                    const std::vector<Peak>& bottoms) {
  std::vector<Edge> edges;
  edges.reserve(tops.size() + bottoms.size());
  for (const Peak& p : tops) edges.push_back(Edge{p.position, p.value, 1});
  for (const Peak& p : bottoms) edges.push_back(Edge{p.position, p.value, -1});
  std::stable_sort(edges.begin(), edges.end(),
                   [](const Edge& a, const Edge& b) { return a.position < b.position; });
  return edges;
}

// A rounded pixel coordinate as int. Values far outside any image (a nearly horizontal lane
// line evaluated at a distant row) are held at +-1e8, where every in-image test still sees
// them outside, instead of overflowing the conversion.
inline int toPixel(double value) {
  if (std::isnan(value)) return 0;
  return static_cast<int>(std::min(std::max(value, -1.0e8), 1.0e8));
}

// max(profile - 0.5 * mean(profile), 0): keeps the parts that stand above the general level.
inline cv::Mat dropBelowHalfMean(const cv::Mat& profile) {
  const double mean = cv::mean(profile)[0];
  return cv::Mat(cv::max(profile - 0.5 * mean, 0.0));
}

// positive = max(g, 0) and negative = max(-g, 0), in one pass.
inline void splitSigns(const cv::Mat& g, cv::Mat_<float>& positive, cv::Mat_<float>& negative) {
  positive.create(g.rows, g.cols);
  negative.create(g.rows, g.cols);
  for (int r = 0; r < g.rows; ++r) {
    const float* src = g.ptr<float>(r);
    float* pos = positive.ptr<float>(r);
    float* neg = negative.ptr<float>(r);
    for (int c = 0; c < g.cols; ++c) {
      pos[c] = std::max(src[c], 0.0f);
      neg[c] = std::max(-src[c], 0.0f);
    }
  }
}

}  // namespace viraduve
