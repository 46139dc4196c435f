// Equality and printing of frame rectangles for the expectations of these tests.
#pragma once

#include <ostream>

#include "viraduve/records.h"

namespace viraduve {

inline bool operator==(const ROI& a, const ROI& b) {
  return a.x1 == b.x1 && a.y1 == b.y1 && a.x2 == b.x2 && a.y2 == b.y2;
}

inline std::ostream& operator<<(std::ostream& os, const ROI& r) {
  return os << "(" << r.x1 << ", " << r.y1 << ", " << r.x2 << ", " << r.y2 << ")";
}

}  // namespace viraduve
