// Peaks of a one-dimensional profile: local maxima whose mean valley depth on both sides
// exceeds a small fraction of the profile's range, so that ripples of a flat profile do not
// count. Every search of the detector (lane centres, band edges) ends here.
#include <algorithm>
#include <cmath>
#include <vector>

#include "detector/BandLaneDetectionImpl.h"

namespace viraduve {

void BandLaneDetectionImpl::findPeaks(const cv::Mat& profile, std::vector<Peak>& peaks) {
  peaks.clear();
  cv::Mat row;
  if (profile.cols == 1)
    row = profile.t();
  else if (profile.rows == 1)
    row = profile.clone();
  else
    return;
  if (row.type() != CV_32FC1) row.convertTo(row, CV_32F);
  const int n = row.cols;
  if (n < 1) return;
  const float* x = row.ptr<float>(0);

  // Flat steps are skipped: a plateau counts as one sample.
  std::vector<int> idx;
  std::vector<float> y;
  for (int i = 0; i + 1 < n; ++i) {
    if (std::fabs(x[i + 1] - x[i]) > 1e-7) {
      idx.push_back(i);
      y.push_back(x[i]);
    }
  }
  if (!idx.empty()) {
    idx.push_back(n - 1);
    y.push_back(x[n - 1]);
  }
  const int m = static_cast<int>(y.size());

  std::vector<int> sign;
  for (int j = 0; j + 1 < m; ++j) sign.push_back(y[j + 1] - y[j] > 0 ? 1 : -1);
  std::vector<int> peakIdx;
  std::vector<int> valleyIdx;
  for (int j = 0; j + 1 < static_cast<int>(sign.size()); ++j) {
    const int turn = sign[j + 1] - sign[j];
    if (turn < -0.5)
      peakIdx.push_back(idx[j]);
    else if (turn > 0.5)
      valleyIdx.push_back(idx[j]);
  }
  if (peakIdx.empty()) return;

  if (peakIdx.size() == 1 && valleyIdx.empty()) {
    valleyIdx = {0, n - 1};
  } else {
    if (valleyIdx.empty() || peakIdx.front() < valleyIdx.front())
      valleyIdx.insert(valleyIdx.begin(), 0);
    if (peakIdx.back() > valleyIdx.back()) valleyIdx.push_back(n - 1);
  }

  float minValue = x[0];
  float maxValue = x[0];
  for (int i = 1; i < n; ++i) {
    minValue = std::min(minValue, x[i]);
    maxValue = std::max(maxValue, x[i]);
  }
  const float range = maxValue - minValue;

  // Peaks and valleys alternate, so there is one valley more than peaks; the bound only
  // protects against a profile that breaks that (NaN samples).
  for (std::size_t p = 0; p < peakIdx.size() && p + 1 < valleyIdx.size(); ++p) {
    const float P = x[peakIdx[p]];
    const float L = x[valleyIdx[p]] - P;
    const float R = x[valleyIdx[p + 1]] - P;
    const float prominence = (std::fabs(L) + std::fabs(R)) / 2;
    if (prominence > 0.001 * range) peaks.push_back(Peak{peakIdx[p] + 1, P});
  }
}

}  // namespace viraduve
