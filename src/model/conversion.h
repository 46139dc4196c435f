// Conversions between exchange records (requests, responses) and working records.
#pragma once

#include <vector>

#include "viraduve/records.h"

namespace viraduve {

ImageParam toImageParam(const CloudImageParam& p);
ROI toROI(const CloudFrame& f);
Band2D toBand2D(const CloudBand& b);
Lane2D toLane2D(const CloudLane& l);
Region2D toRegion2D(const CloudRegion& r);
std::vector<Region2D> toRegion2DList(const std::vector<CloudRegion>& regions);
// Band2D merged into an existing CloudBand (copies, floors at 1e-10, NaN densities to 0).
void mergeBand(const Band2D& band, CloudBand& cloud);
// Region2D results into an existing CloudRegion (texts kept).
void mergeRegion(const Region2D& region, CloudRegion& cloud);

// Merges the results into the request's exchange lists, by position; lists only grow.
void instrument2cloudAnalysisObject(std::vector<CloudFrame>& cloudFrames,
                                    std::vector<std::vector<CloudLane>>& cloudLanes,
                                    std::vector<ROI> rois,
                                    std::vector<std::vector<Lane2D>> lanes2d);

}  // namespace viraduve
