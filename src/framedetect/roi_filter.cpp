#include "framedetect/roi_filter.h"

#include <algorithm>
#include <cstdint>

#include "common/log.h"

namespace viraduve {

namespace {

// Products in 64 bits: the same values as 32-bit ones wherever those do not overflow.
float area(const ROI& r) {
  return static_cast<float>(int64_t(r.x2 - r.x1) * int64_t(r.y2 - r.y1));
}

int64_t overlap(const ROI& a, const ROI& b) {
  const int32_t w = std::min(a.x2, b.x2) - std::max(a.x1, b.x1);
  const int32_t h = std::min(a.y2, b.y2) - std::max(a.y1, b.y1);
  return (w > 0 && h > 0) ? int64_t(w) * h : 0;
}

}  // namespace

void filterROI(std::vector<ROI>& roiListIn, std::vector<ROI>& roiListOut) {
  std::sort(roiListIn.begin(), roiListIn.end(),
            [](const ROI& a, const ROI& b) { return area(a) > area(b); });
  // Built aside, so that the output may be the input itself.
  std::vector<ROI> kept_list;
  for (std::size_t i = 0; i < roiListIn.size(); ++i) {
    const ROI& cand = roiListIn[i];
    const float roi_area_1 = area(cand);
    logLine("i: ", i);
    logLine("roi_area_1: ", roi_area_1);
    logLine("roi_list_out.size(): ", kept_list.size());
    if (kept_list.empty()) {
      kept_list.push_back(cand);
      logLine("add 1st roi");
      continue;
    }
    bool duplicate = false;
    for (const ROI& kept : kept_list) {
      printROI(cand);
      printROI(kept);
      const int64_t overlap_area = overlap(cand, kept);
      const float roi_area_2 = area(kept);
      logLine("overlap_area: ", overlap_area);
      logLine("roi_area_1: ", roi_area_1);
      logLine("roi_area_2: ", roi_area_2);
      if (double(overlap_area) > 0.9 * double(std::min(roi_area_1, roi_area_2))) {
        duplicate = true;
        break;
      }
    }
    if (!duplicate) {
      logLine("add ");
      kept_list.push_back(cand);
    }
  }
  std::sort(kept_list.begin(), kept_list.end(), [](const ROI& a, const ROI& b) {
    return 0.5 * a.x1 + a.y1 < 0.5 * b.x1 + b.y1;
  });
  roiListOut = std::move(kept_list);
}

}  // namespace viraduve
