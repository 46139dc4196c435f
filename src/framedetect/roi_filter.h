// Duplicate removal and reading order for the frame candidates of the edge route.
#pragma once

#include <vector>

#include "viraduve/records.h"

namespace viraduve {

// Sorts roiListIn by area, largest first; keeps in roiListOut each rectangle whose overlap
// with every rectangle kept before it is at most 0.9 of the smaller area, then orders the
// kept ones by 0.5 x1 + y1 (top to bottom, with a bias to the left). Logs its steps.
void filterROI(std::vector<ROI>& roiListIn, std::vector<ROI>& roiListOut);

}  // namespace viraduve
