// Duplicate removal and reading order of frame candidates.
#include <string>
#include <vector>

#include <gtest/gtest.h>

#include "framedetect/roi_filter.h"
#include "roi_compare.h"
#include "test_support.h"

namespace {

using viraduve::ROI;

struct FilterCase {
  const char* name;
  std::vector<ROI> in;
  std::vector<ROI> expected;
};

class FilterRoiCases : public ::testing::TestWithParam<FilterCase> {};

TEST_P(FilterRoiCases, KeepsDistinctFramesInReadingOrder) {
  std::vector<ROI> in = GetParam().in;
  std::vector<ROI> out{{1, 2, 3, 4}};  // stale content is replaced
  viraduve::test::StdoutCapture capture;
  viraduve::filterROI(in, out);
  capture.finish();
  EXPECT_EQ(out, GetParam().expected);
}

INSTANTIATE_TEST_SUITE_P(
    Cases, FilterRoiCases,
    ::testing::Values(
        FilterCase{"single", {{5, 6, 50, 60}}, {{5, 6, 50, 60}}},
        FilterCase{"empty", {}, {}},
        // 9000 shared of the smaller 9500: more than 90 %, the larger stays.
        FilterCase{"overlap95", {{10, 0, 105, 100}, {0, 0, 100, 100}}, {{0, 0, 100, 100}}},
        // Exactly 90 % of the smaller area is not a duplicate.
        FilterCase{"overlap90", {{0, 0, 100, 100}, {10, 0, 110, 100}},
                   {{0, 0, 100, 100}, {10, 0, 110, 100}}},
        FilterCase{"nested", {{40, 40, 45, 45}, {0, 0, 100, 100}}, {{0, 0, 100, 100}}},
        FilterCase{"edgeTouch", {{0, 0, 10, 10}, {10, 0, 20, 10}}, {{0, 0, 10, 10}, {10, 0, 20, 10}}},
        FilterCase{"diagonal", {{0, 0, 10, 10}, {20, 20, 25, 25}}, {{0, 0, 10, 10}, {20, 20, 25, 25}}},
        // Keys 0.5 x1 + y1: 210 and 200, so the lower-left frame reads first.
        FilterCase{"readingOrder", {{400, 10, 500, 100}, {0, 200, 150, 300}},
                   {{0, 200, 150, 300}, {400, 10, 500, 100}}},
        // A duplicate of the second kept frame only.
        FilterCase{"secondKept", {{0, 0, 100, 100}, {200, 0, 290, 100}, {202, 2, 290, 100}},
                   {{0, 0, 100, 100}, {200, 0, 290, 100}}}),
    [](const auto& info) { return std::string(info.param.name); });

TEST(FilterRoi, LogsEveryComparison) {
  std::vector<ROI> in{{0, 0, 10, 10}, {0, 0, 100, 100}};
  std::vector<ROI> out;
  viraduve::test::StdoutCapture capture;
  viraduve::filterROI(in, out);
  EXPECT_EQ(capture.finish(),
            "i: 0\nroi_area_1: 10000\nroi_list_out.size(): 0\nadd 1st roi\n"
            "i: 1\nroi_area_1: 100\nroi_list_out.size(): 1\n"
            "====ROI====\nx1:   0, x2:  10, y1:   0, y2:  10\n"
            "====ROI====\nx1:   0, x2: 100, y1:   0, y2: 100\n"
            "overlap_area: 100\nroi_area_1: 100\nroi_area_2: 10000\n");
  // The input is left sorted by area, largest first.
  EXPECT_EQ(in.front(), (ROI{0, 0, 100, 100}));
}

TEST(FilterRoi, OutputMayBeTheInput) {
  std::vector<ROI> list{{400, 10, 500, 100}, {0, 200, 150, 300}, {1, 201, 150, 300}};
  viraduve::test::StdoutCapture capture;
  viraduve::filterROI(list, list);
  capture.finish();
  EXPECT_EQ(list, (std::vector<ROI>{{0, 200, 150, 300}, {400, 10, 500, 100}}));
}

}  // namespace
