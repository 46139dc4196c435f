// convertAndExportImage from request texts to image files, as a host calls it.
#include <gtest/gtest.h>

#include <sys/stat.h>

#include <filesystem>
#include <fstream>
#include <sstream>
#include <string>
#include <vector>

#include <json/json.h>
#include <opencv2/imgcodecs.hpp>
#include <opencv2/imgproc.hpp>

#include "synth.h"
#include "test_support.h"
#include "viraduve/viraduve.h"

namespace viraduve {
namespace {

namespace fs = std::filesystem;
using test::StdoutCapture;
using test::TempDir;

std::string toText(const Json::Value& v) {
  Json::StreamWriterBuilder builder;
  return Json::writeString(builder, v);
}

Json::Value parse(const std::string& text) {
  Json::Value v;
  std::istringstream(text) >> v;
  return v;
}

// A two-channel gel (red and green on black) with every kind of overlay in the request.
struct ExportRequest {
  TempDir dir;
  synth::Truth truth;
  Json::Value attributes = parse(R"({"exportAttribute": {"exportLayers": true, "format": 1,
      "channelSelection": 2, "dpi": 300, "height": 5.0, "width": 8.0,
      "exportAnnotation": true, "exportMarkers": true}})");
  std::string overlay = R"({"overlayList": [0, 1]})";
  std::string annotations = R"({"annotationAttribute": [{"channel": 0, "Annotation": [
      {"type": "arrow", "textColor": "#FF5000", "roi": {"x1": 60, "y1": 250, "x2": 110, "y2": 280}},
      {"type": "line", "textColor": "#9933FF", "roi": {"x1": 250, "y1": 260, "x2": 330, "y2": 260}},
      {"type": "shape", "textColor": "#ADFF2F", "fillColor": "#663300",
       "roi": {"x1": -30, "y1": 235, "x2": 15, "y2": 265}},
      {"type": "TEXT", "textColor": "#FFFF00", "fillColor": "#E9EBEC", "exportTextSize": 14,
       "angle": 0.0, "roi": {"x1": 200, "y1": 5, "x2": 380, "y2": 40}, "text": ["Export test"]}]}]})";
  std::string regions = R"({"region_list": [
      {"circle_b": false, "channel": 0, "regionRefName": "R1", "x1": 150, "y1": 60, "x2": 190, "y2": 90},
      {"circle_b": true, "channel": 0, "regionRefName": "C1", "x": 300, "y": 200, "circle_radius": 20}]})";
  std::string markers = R"({"mwMarkerFrame": [{"frameId": "frame0", "mwMarkerLane": [{"mwMarkerBand": [
      {"bandId": "frame0-lane0-band0-ch0", "mwMarkerWt": 250},
      {"bandId": "frame0-lane0-band1-ch0", "mwMarkerWt": 75.5},
      {"bandId": "frame0-lane0-band2-ch0", "mwMarkerWt": 10}]}]}]})";
  std::string frames, paras, tpn, texts = R"(["first", "second"])", platform = "Windows_NT";

  ExportRequest() {
    synth::CaptureSpec plan = synth::cleanGel(400, 300, 4, 3, 11);
    plan.channels = 2;
    truth = synth::writeCapture(plan, dir.path());
    frames = "[" + synth::truthFrameJson(truth, 0) + "]";
    paras = synth::imageParasJson(2);
    tpn = "[{\"uid\": \"frame0\", \"channel\": 0, \"referanceLane\": " + tpnLane(0) +
          ", \"normalizeLanes\": [" + tpnLane(1) + "], \"excludedLanes\": [" + tpnLane(3) + "]}]";
  }

  // Lane-volume brackets 10 pixels inside the frame's top and bottom.
  std::string tpnLane(int lane) const {
    const synth::TruthFrame& f = truth.frames[0];
    const synth::TruthLane& l = f.lanes[lane];
    const int x1 = static_cast<int>(l.centreTop) - l.width / 2;
    const int x2 = x1 + l.width;
    std::ostringstream os;
    os << "{\"uid\": \"frame0-lane" << lane << "\", \"laneVolTop\": {\"x1\": " << x1 << ", \"x2\": "
       << x2 << ", \"y1\": " << f.y1 + 10 << ", \"y2\": " << f.y1 + 14 << "}, \"laneVolBottom\": {\"x1\": "
       << x1 << ", \"x2\": " << x2 << ", \"y1\": " << f.y2 - 14 << ", \"y2\": " << f.y2 - 10 << "}}";
    return os.str();
  }

  int run(std::string& log, const std::string* attributeText = nullptr) {
    const std::string a = attributeText ? *attributeText : toText(attributes);
    StdoutCapture out;
    const int status = convertAndExportImage(
        dir.path().c_str(), frames.c_str(), regions.c_str(), "fluo", nullptr, a.c_str(),
        paras.c_str(), overlay.c_str(), annotations.c_str(), 0, tpn.c_str(), markers.c_str(),
        texts.c_str(), platform.c_str());
    log = out.finish();
    return status;
  }

  cv::Mat output(const std::string& name) const {
    return cv::imread(dir.file("output/" + name), cv::IMREAD_UNCHANGED);
  }
};

// Pixels within 45 of colour (blue, green, red) inside the area; anti-aliased lines of one
// pixel do not reach their full colour.
int colourCount(const cv::Mat& picture, cv::Rect area, cv::Vec3b colour) {
  area &= cv::Rect(0, 0, picture.cols, picture.rows);
  int n = 0;
  for (int y = area.y; y < area.y + area.height; ++y) {
    for (int x = area.x; x < area.x + area.width; ++x) {
      const cv::Vec3b p = picture.at<cv::Vec3b>(y, x);
      if (std::abs(p[0] - colour[0]) <= 45 && std::abs(p[1] - colour[1]) <= 45 &&
          std::abs(p[2] - colour[2]) <= 45) {
        ++n;
      }
    }
  }
  return n;
}

// The columns and rows that are mostly not white: the capture inside its white margins.
cv::Rect pictureArea(const cv::Mat& picture) {
  cv::Mat grey, cols, rows;
  cv::cvtColor(picture, grey, cv::COLOR_BGR2GRAY);
  const cv::Mat notWhite = (grey < 250) / 255;
  cv::reduce(notWhite, cols, 0, cv::REDUCE_SUM, CV_32S);
  cv::reduce(notWhite, rows, 1, cv::REDUCE_SUM, CV_32S);
  std::vector<cv::Point> xs, ys;
  cv::findNonZero(cols > picture.rows * 0.6, xs);
  cv::findNonZero(rows > picture.cols * 0.6, ys);
  if (xs.empty() || ys.empty()) return {};
  return cv::Rect(cv::Point(xs.front().x, ys.front().y), cv::Point(xs.back().x + 1, ys.back().y + 1));
}

TEST(ExportFlow, FullExportDrawsEveryOverlayAtThePrintSize) {
  ExportRequest request;
  std::string log;
  ASSERT_EQ(request.run(log), 0) << log;
  EXPECT_NE(log.find("Image export algorithm completed!\n"), std::string::npos);
  EXPECT_NE(log.find("overlayList[1]: 1\n"), std::string::npos);

  const cv::Mat ch0 = request.output("ch0.png");
  const cv::Mat ch1 = request.output("ch1.png");
  ASSERT_FALSE(ch0.empty());
  ASSERT_FALSE(ch1.empty());
  // 5 cm at 300 dpi is 590.55 rows; the width follows the picture's aspect within 8 cm.
  EXPECT_EQ(ch0.rows, 590);
  EXPECT_LE(ch0.cols, 944);
  EXPECT_EQ(ch1.size(), ch0.size());
  // Kept beside the test program for a person to look at.
  cv::imwrite((fs::read_symlink("/proc/self/exe").parent_path() / "export_example.png").string(), ch0);

  const cv::Rect area = pictureArea(ch0);
  ASSERT_GT(area.width, 0);
  const double s = area.height / 300.0;  // output pixels per capture pixel
  EXPECT_NEAR(area.width / 400.0, s, 0.02);
  EXPECT_GT(area.x, 0);  // margins for the frame name, markers and the shape outside
  const auto at = [&](double x, double y, double w, double h) {
    return cv::Rect(area.x + static_cast<int>(x * s) - 3, area.y + static_cast<int>(y * s) - 3,
                    static_cast<int>(w * s) + 7, static_cast<int>(h * s) + 7);
  };
  const synth::TruthFrame& f = request.truth.frames[0];
  const auto laneLine = [&](int lane) {
    const synth::TruthLane& l = f.lanes[lane];
    return at(l.centreTop, f.y1 + 30, 0, f.y2 - f.y1 - 60);
  };
  const int laneRows = static_cast<int>((f.y2 - f.y1 - 60) * s);
  // Frame outline, left edge.
  EXPECT_GT(colourCount(ch0, at(f.x1, f.y1, 0, f.y2 - f.y1), {255, 255, 24}), laneRows);
  // Reference lane 1, excluded lane 4, normal lane 3.
  EXPECT_GT(colourCount(ch0, laneLine(0), {89, 0, 255}), laneRows / 2);
  EXPECT_GT(colourCount(ch0, laneLine(3), {117, 107, 92}), laneRows / 2);
  EXPECT_GT(colourCount(ch0, laneLine(2), {164, 228, 37}), laneRows / 2);
  // A band box of lane 3.
  const synth::TruthBand& b = f.lanes[2].bands[1];
  EXPECT_GT(colourCount(ch0, at(b.x1, b.y1, b.x2 - b.x1, 0), {164, 228, 37}), 10);
  // Marker labels and ticks left of the frame.
  EXPECT_GT(colourCount(ch0, cv::Rect(0, 0, area.x + static_cast<int>(f.x1 * s), ch0.rows), {181, 8, 228}), 20);
  // Regions of channel 0 on a dark picture.
  EXPECT_GT(colourCount(ch0, at(150, 60, 40, 30), {8, 191, 250}), 50);
  EXPECT_GT(colourCount(ch0, at(280, 180, 40, 40), {8, 191, 250}), 50);
  EXPECT_EQ(colourCount(ch1, at(150, 60, 40, 30), {8, 191, 250}), 0);
  // Annotations of channel 0: arrow, line, the shape in the left margin, the text.
  EXPECT_GT(colourCount(ch0, at(60, 250, 50, 30), {0, 80, 255}), 20);
  EXPECT_GT(colourCount(ch0, at(250, 255, 80, 10), {255, 51, 153}), 40);
  EXPECT_GT(colourCount(ch0, at(-30, 235, 45, 30), {0, 51, 102}), 200);
  EXPECT_GT(colourCount(ch0, at(200, 5, 180, 35), {0, 255, 255}), 40);
  EXPECT_EQ(colourCount(ch1, at(200, 5, 180, 35), {0, 255, 255}), 0);
}

TEST(ExportFlow, PathsAreJoinedWithSlashOnEveryPlatformName) {
  for (const char* platform : {"Windows_NT", "Darwin", "", "Linux"}) {
    ExportRequest request;
    request.platform = platform;
    std::string log;
    ASSERT_EQ(request.run(log), 0) << platform << "\n" << log;
    EXPECT_TRUE(fs::exists(request.dir.file("output/ch0.png"))) << platform;
    EXPECT_TRUE(fs::exists(request.dir.file("output/ch1.png"))) << platform;
    for (const auto& e : fs::directory_iterator(request.dir.path())) {
      const std::string name = e.path().filename().string();
      EXPECT_TRUE(name == "output" || name.rfind("ch", 0) == 0) << platform << ": " << name;
    }
  }
}

TEST(ExportFlow, ParseFailuresAnswerZeroOnlyInTheAnnotationBranch) {
  const struct {
    const char* name;
    bool annotations;
    std::string ExportRequest::*text;  // the broken document; null: the attributes
    const char* line;
    int status;
  } cases[] = {
      {"attributes", true, nullptr, "Failed to parse export Attribute Params", -1},
      {"annotations", true, &ExportRequest::annotations, "Failed to parse annotationAttribute", 0},
      {"overlay, annotations wanted", true, &ExportRequest::overlay, "Failed to parse overlayList", 0},
      {"overlay", false, &ExportRequest::overlay, "Failed to parse overlayList", -1},
      {"annotations not wanted", false, &ExportRequest::annotations, nullptr, 0},
      {"frames", true, &ExportRequest::frames, "Failed to parse analysis Frame", -1},
      {"regions", true, &ExportRequest::regions, "Failed to parse RegionList", -1},
      {"image params", true, &ExportRequest::paras, "Failed to parse image params", -1},
      {"tpn frames", true, &ExportRequest::tpn, "Failed to parse tpnFrameList", -1},
      {"markers", true, &ExportRequest::markers, "Failed to parse marker Weights", -1},
      {"text list", true, &ExportRequest::texts, "Failed to parse overlayList", -1},
  };
  const std::string broken = "{\"x\": ";
  for (const auto& c : cases) {
    ExportRequest request;
    request.attributes["exportAttribute"]["exportAnnotation"] = c.annotations;
    if (c.text != nullptr) request.*c.text = broken;
    std::string log;
    EXPECT_EQ(request.run(log, c.text == nullptr ? &broken : nullptr), c.status) << c.name << "\n" << log;
    if (c.line == nullptr) {
      EXPECT_TRUE(fs::exists(request.dir.file("output/ch0.png"))) << c.name;
      continue;
    }
    EXPECT_NE(log.find(std::string(c.line) + "\n"), std::string::npos) << c.name << "\n" << log;
    EXPECT_FALSE(fs::exists(request.dir.file("output"))) << c.name;
  }
}

TEST(ExportFlow, FailuresAnswerMinusOneWithTheirMessage) {
  ExportRequest mismatch;
  mismatch.paras = synth::imageParasJson(1);
  std::string log;
  EXPECT_EQ(mismatch.run(log), -1);
  EXPECT_NE(log.find("dadodazeda Error: ERROR! Image File Number is Not Equal to Image Parameter "
                     "Number (code: -4) in the function Export::runImageExport of file "
                     "DaduZerovoVur\\ImageExport at line 1471\n"
                     "ERROR in __FUNCTION__ = convertAndExportImage\n"),
            std::string::npos)
      << log;

  ExportRequest badIndex;
  badIndex.overlay = R"({"overlayList": [0, 7]})";
  EXPECT_EQ(badIndex.run(log), -1);
  EXPECT_NE(log.find("invalid vector<T> subscript\nERROR in __FUNCTION__ = convertAndExportImage\n"),
            std::string::npos)
      << log;
  EXPECT_FALSE(fs::exists(badIndex.dir.file("output")));

  // Print sizes that make no picture, or one too large to hold, fail cleanly.
  for (int dpi : {0, 1000000}) {
    ExportRequest absurd;
    absurd.attributes["exportAttribute"]["dpi"] = dpi;
    EXPECT_EQ(absurd.run(log), -1) << dpi;
    EXPECT_NE(log.find("ERROR in __FUNCTION__ = convertAndExportImage\n"), std::string::npos) << log;
  }

  // An output folder that cannot be written is a failure, not a completed export.
  ExportRequest blocked;
  std::ofstream(blocked.dir.file("output")) << "in the way";
  EXPECT_EQ(blocked.run(log), -1);
  EXPECT_EQ(log.find("Image export algorithm completed!"), std::string::npos) << log;
}

}  // namespace
}  // namespace viraduve

namespace viraduve {
namespace {

// Exported pictures are written through a private temporary file; the result must still be
// readable like any file the user creates (0666 less the umask), not owner-only.
TEST(ExportFlow, WrittenFilesGetTheUsualMode) {
  ExportRequest request;
  const mode_t previous = umask(022);
  std::string log;
  const int status = request.run(log);
  umask(previous);
  ASSERT_EQ(status, 0) << log;
  const fs::perms p = fs::status(request.dir.file("output/ch0.png")).permissions();
  EXPECT_EQ(p & fs::perms::all, fs::perms(0644));
}

}  // namespace
}  // namespace viraduve
