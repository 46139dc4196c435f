// Every exported function on malformed, hostile or missing input. Each case runs in a child
// process (so a crash shows as that case's failure and the others still run), checks the
// kind of answer a host is promised (a JSON answer, no answer, "error" or a status) and that
// a failed call left every file of the capture as it was.
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <functional>
#include <iostream>
#include <map>
#include <memory>
#include <sstream>
#include <string>
#include <vector>

#include <json/json.h>
#include <opencv2/core.hpp>
#include <opencv2/imgcodecs.hpp>

#include "synth.h"
#include "test_support.h"
#include "viraduve/viraduve.h"

namespace viraduve {
namespace {

namespace fs = std::filesystem;
using test::StdoutCapture;
using test::TempDir;

// ---- answers -------------------------------------------------------------------------------

enum class Kind { Json, Null, Error, Status };

struct Expected {
  Kind kind = Kind::Json;
  const char* envelope = "frameLanesBands";  // Json: the single member of the answer
  int status = 0;                            // Status: the integer answered
  bool failed = true;                        // the call must leave the capture untouched
};

Expected json(const char* envelope = "frameLanesBands") { return {Kind::Json, envelope, 0, false}; }
Expected none() { return {Kind::Null, nullptr, 0, true}; }
Expected error() { return {Kind::Error, nullptr, 0, true}; }
// Export: 0 written, -1 failed; 0 is also the answer of a refused annotation document.
Expected exported() { return {Kind::Status, nullptr, 0, false}; }
Expected refusedExport(int status) { return {Kind::Status, nullptr, status, true}; }
// vitToTiff: 1 written, -1 not.
Expected converted() { return {Kind::Status, nullptr, 1, false}; }
Expected notConverted() { return {Kind::Status, nullptr, -1, true}; }

struct Answer {
  Kind kind = Kind::Null;
  std::string text;
  int status = 0;
};

Answer fromText(char* result) {
  Answer a;
  if (result == nullptr) return a;
  a.text = result;
  const bool isError = a.text == "error";
  releaseResult(result);  // ignores the constant "error"
  a.kind = isError ? Kind::Error : Kind::Json;
  return a;
}

Answer fromStatus(int status) {
  Answer a;
  a.kind = Kind::Status;
  a.status = status;
  return a;
}

// Answers may hold the NaN and Infinity tokens.
bool parseAnswer(const std::string& text, Json::Value& root, std::string& errors) {
  Json::CharReaderBuilder builder;
  builder["allowSpecialFloats"] = true;
  std::unique_ptr<Json::CharReader> reader(builder.newCharReader());
  return reader->parse(text.data(), text.data() + text.size(), &root, &errors);
}

const char* kindName(Kind k) {
  switch (k) {
    case Kind::Json: return "a JSON answer";
    case Kind::Null: return "no answer (null)";
    case Kind::Error: return "\"error\"";
    case Kind::Status: return "a status";
  }
  return "?";
}

// Empty when the answer is the expected one, else what differs.
std::string compare(const Answer& a, const Expected& e) {
  std::ostringstream why;
  if (a.kind != e.kind) {
    why << "expected " << kindName(e.kind) << ", got " << kindName(a.kind);
    if (a.kind == Kind::Json) why << ": " << a.text.substr(0, 300);
    return why.str();
  }
  if (e.kind == Kind::Status && a.status != e.status) {
    why << "expected status " << e.status << ", got " << a.status;
  }
  if (e.kind == Kind::Json) {
    Json::Value root;
    std::string errors;
    if (!parseAnswer(a.text, root, errors)) {
      why << "the answer is not JSON: " << errors;
    } else if (!root.isObject() || root.size() != 1 || !root[e.envelope].isArray()) {
      why << "the answer has no \"" << e.envelope << "\" list";
    }
  }
  return why.str();
}

// ---- the capture and its request texts -----------------------------------------------------

// What lies in the capture folder handed to the library.
enum class Folder {
  Gel,          // one 120 x 100 channel with two lanes of two bands
  TwoChannels,  // the same gel in two channels
  Missing,      // the folder does not exist
  Empty,        // the folder holds no channel file
  EmptyCh0,     // ch0.tif has no byte
  TextCh0,      // ch0.tif holds text
  OnePixel,     // ch0.tif is 1 x 1
  SizesDiffer,  // ch0.tif 120 x 100, ch1.tif 60 x 50
  Thin,         // ch0.tif 2 columns of 200000 rows
  ReadOnly,     // the gel in a folder the caller cannot write
};

// A text argument that may be a null pointer.
struct Arg {
  bool null = false;
  std::string text;
  Arg() = default;
  Arg(std::string t) : text(std::move(t)) {}  // NOLINT: texts convert implicitly
  Arg(const char* t) : text(t) {}             // NOLINT
  const char* get() const { return null ? nullptr : text.c_str(); }
};

Arg nullArg() {
  Arg a;
  a.null = true;
  return a;
}

std::string toText(const Json::Value& v) {
  Json::StreamWriterBuilder builder;
  builder["indentation"] = "";
  return Json::writeString(builder, v);
}

Json::Value parse(const std::string& text) {
  Json::Value v;
  std::istringstream(text) >> v;
  return v;
}

// Every argument of every exported function, valid for the gel capture until a case changes it.
struct Request {
  Arg dir, mode = "uv", paras, frame, frameList, regions, bg, tpn;
  Arg attributes, overlay, annotations, tpnFrames, markers, texts, platform = "Windows_NT";
  int channelStep = 0;
  Arg source, target;  // vitToTiff
};

struct Capture {
  TempDir root;
  std::string dir;
  synth::Truth truth;
  Json::Value frameDoc;  // {"analysisFrame": ...} of the gel

  explicit Capture(Folder folder) : dir(root.file("capture")) {
    synth::CaptureSpec plan = synth::cleanGel(120, 100, 2, 2, 5);
    if (folder == Folder::TwoChannels) plan.channels = 2;
    if (folder != Folder::Missing) fs::create_directory(dir);
    std::vector<cv::Mat> unused;  // pictures rendered only for their truth
    switch (folder) {
      case Folder::Missing:
      case Folder::Empty:
        truth = synth::render(plan, unused);
        break;
      case Folder::EmptyCh0:
        truth = synth::render(plan, unused);
        std::ofstream(dir + "/ch0.tif");
        break;
      case Folder::TextCh0:
        truth = synth::render(plan, unused);
        std::ofstream(dir + "/ch0.tif") << "this is not an image\n";
        break;
      case Folder::OnePixel:
        truth = synth::render(plan, unused);
        test::writeImage(dir + "/ch0.tif", cv::Mat(1, 1, CV_16UC1, cv::Scalar(1234)));
        break;
      case Folder::Thin:
        truth = synth::render(plan, unused);
        test::writeImage(dir + "/ch0.tif", cv::Mat(200000, 2, CV_16UC1, cv::Scalar(1000)));
        break;
      case Folder::SizesDiffer: {
        plan.channels = 2;
        truth = synth::writeCapture(plan, dir);
        cv::Mat small(50, 60, CV_16UC1, cv::Scalar(1000));
        test::writeImage(dir + "/ch1.tif", small);
        break;
      }
      default:
        truth = synth::writeCapture(plan, dir);
        break;
    }
    frameDoc = parse(synth::truthFrameJson(truth, 0));
  }

  Request request(Folder folder) const {
    const int channels = folder == Folder::TwoChannels || folder == Folder::SizesDiffer ? 2 : 1;
    Request r;
    r.dir = dir;
    r.paras = synth::imageParasJson(channels);
    r.frame = toText(frameDoc);
    r.frameList = "[" + r.frame.text + "]";
    r.regions =
        R"({"region_list": [{"circle_b": false, "channel": 0, "uid": "r0", "x1": 10, "y1": 10, "x2": 30, "y2": 30},)"
        R"( {"circle_b": true, "channel": 0, "uid": "c0", "x": 60, "y": 50, "circle_radius": 8}]})";
    r.bg = R"({"bgRegion": {"circle_b": false, "x1": 0, "y1": 0, "x2": 20, "y2": 20}})";
    r.tpn = tpnRequest(0, 1);
    r.attributes =
        R"({"exportAttribute": {"exportLayers": true, "format": 1, "channelSelection": 2, "dpi": 100,)"
        R"( "height": 3.0, "width": 3.0, "exportAnnotation": false, "exportMarkers": false}})";
    r.overlay = R"({"overlayList": [0]})";
    r.annotations = R"({"annotationAttribute": []})";
    r.tpnFrames = "[]";
    r.markers = R"({"mwMarkerFrame": []})";
    r.texts = "[]";
    r.source = dir + "/ch0.tif";
    r.target = root.file("converted.tif");
    return r;
  }

  // Names the given lanes of the gel's frame for normalisation over the frame's height.
  std::string tpnRequest(int firstLane, int lastLane) const {
    const Json::Value& f = frameDoc["analysisFrame"];
    Json::Value tpn;
    Json::Value& entry = tpn["frameList"][0];
    for (const char* k : {"x1", "x2", "y1", "y2"}) entry["analysisFrameRoi"][k] = f[k];
    entry["uid"] = "frame0";
    entry["channel"] = 0;
    for (int j = firstLane; j <= lastLane; ++j) {
      Json::Value named;
      named["laneVolTop"]["y1"] = f["y1"];
      named["laneVolBottom"]["y2"] = f["y2"];
      named["uid"] = f["roiList"][j]["lane"]["uid"];
      for (const char* k : {"x1", "x2", "y1", "y2"}) named["laneRoi"][k] = f["roiList"][j]["lane"][k];
      entry["normalizeLanes"].append(named);
    }
    return toText(tpn);
  }
};

// Every file below the folder with its bytes (and "output" when the export created it).
std::map<std::string, std::vector<unsigned char>> snapshot(const std::string& dir) {
  std::map<std::string, std::vector<unsigned char>> files;
  std::error_code ec;
  if (!fs::exists(dir, ec)) return files;
  for (const fs::directory_entry& e : fs::recursive_directory_iterator(dir, ec)) {
    const std::string name = fs::relative(e.path(), dir).string();
    files[name] = e.is_regular_file() ? test::readBytes(e.path().string())
                                      : std::vector<unsigned char>{'/'};
  }
  return files;
}

// ---- the functions -------------------------------------------------------------------------

enum class Fn { Auto, BandLane, Custom, Update, RollingBall, Region, Tpn, Export, Vit, Release };

Answer call(Fn fn, const Request& r) {
  switch (fn) {
    case Fn::Auto:
      return fromText(getAutoAnalysisFrameDetection(r.dir.get(), r.mode.get(), nullptr, r.paras.get()));
    case Fn::BandLane:
      return fromText(getBandLaneAnalysis(r.dir.get(), r.frame.get(), r.mode.get(), nullptr, r.paras.get()));
    case Fn::Custom:
      return fromText(getCustomAnalysisFrame(r.dir.get(), r.frame.get(), r.mode.get(), nullptr, r.paras.get()));
    case Fn::Update:
      return fromText(getUpdateBandDetection(r.dir.get(), r.frame.get(), r.mode.get(), nullptr, r.paras.get()));
    case Fn::RollingBall:
      return fromText(
          getRollingBallOnAnalysedData(r.dir.get(), r.frame.get(), r.mode.get(), nullptr, r.paras.get()));
    case Fn::Region:
      return fromText(
          getRegionAnalysis(r.dir.get(), r.regions.get(), r.mode.get(), nullptr, r.paras.get(), r.bg.get()));
    case Fn::Tpn:
      return fromText(getTPNAnalysisData(r.dir.get(), r.frame.get(), r.mode.get(), r.tpn.get(), r.paras.get()));
    case Fn::Export:
      return fromStatus(convertAndExportImage(
          r.dir.get(), r.frameList.get(), r.regions.get(), r.mode.get(), nullptr, r.attributes.get(),
          r.paras.get(), r.overlay.get(), r.annotations.get(), r.channelStep, r.tpnFrames.get(),
          r.markers.get(), r.texts.get(), r.platform.get()));
    case Fn::Vit:
      return fromStatus(vitToTiff(r.source.get(), r.target.get()));
    case Fn::Release: {
      // Neither a null pointer nor the constant answer is freed, however often it comes back.
      releaseResult(nullptr);
      char* first = getTPNAnalysisData(nullptr, nullptr, nullptr, nullptr, nullptr);
      char* second = getTPNAnalysisData(nullptr, nullptr, nullptr, nullptr, nullptr);
      if (first == nullptr || first != second || std::strcmp(first, "error") != 0) return fromStatus(-1);
      releaseResult(first);
      releaseResult(second);
      return fromStatus(0);
    }
  }
  return Answer();
}

// ---- the cases -----------------------------------------------------------------------------

using Edit = std::function<void(Request&, const Capture&)>;

struct Case {
  const char* name;
  Fn fn;
  Folder folder;
  Edit edit;
  Expected expected;
  bool dropPrivileges = false;  // run as an unprivileged user (ReadOnly)
};

std::ostream& operator<<(std::ostream& os, const Case& c) { return os << c.name; }

// Helpers that edit the gel's frame document.
Edit frameEdit(const std::function<void(Json::Value& frame)>& change) {
  return [change](Request& r, const Capture& c) {
    Json::Value doc = c.frameDoc;
    change(doc["analysisFrame"]);
    r.frame = toText(doc);
    r.frameList = "[" + r.frame.text + "]";
  };
}

Edit parasEdit(const std::function<void(Json::Value& first)>& change) {
  return [change](Request& r, const Capture&) {
    Json::Value doc = parse(r.paras.text);
    change(doc["ImageParas"][0]);
    r.paras = toText(doc);
  };
}

Json::Value& firstBand(Json::Value& frame) { return frame["roiList"][0]["bands"][0]; }
Json::Value& firstLane(Json::Value& frame) { return frame["roiList"][0]["lane"]; }

std::string nested(int depth) { return std::string(depth, '[') + std::string(depth, ']'); }
std::string megabyte(char c = 'x') { return std::string(1 << 20, c); }

const Edit kNone = [](Request&, const Capture&) {};

std::vector<Case> cases() {
  std::vector<Case> all = {
      // A valid request of each kind: the fixture itself is sound.
      {"AutoValid", Fn::Auto, Folder::Gel, kNone, json()},
      {"BandLaneValid", Fn::BandLane, Folder::Gel, kNone, json()},
      {"CustomValid", Fn::Custom, Folder::Gel, kNone, json()},
      {"UpdateValid", Fn::Update, Folder::Gel, frameEdit([](Json::Value& f) { firstLane(f)["update_flag"] = true; }), json()},
      {"RollingBallValid", Fn::RollingBall, Folder::Gel, kNone, json()},
      {"RegionValid", Fn::Region, Folder::Gel, kNone, json("cloud_region_list")},
      {"TpnValid", Fn::Tpn, Folder::Gel, kNone, json()},
      {"ExportValid", Fn::Export, Folder::Gel, kNone, exported()},
      {"VitValid", Fn::Vit, Folder::Gel, kNone, converted()},
      {"ReleaseResultIgnoresNullAndTheConstant", Fn::Release, Folder::Gel, kNone, {Kind::Status, nullptr, 0, false}},

      // Null pointers read as empty texts; an empty text is no JSON.
      {"AutoNullDir", Fn::Auto, Folder::Gel, [](Request& r, const Capture&) { r.dir = nullArg(); }, error()},
      {"AutoNullMode", Fn::Auto, Folder::Gel, [](Request& r, const Capture&) { r.mode = nullArg(); }, none()},
      {"AutoNullParas", Fn::Auto, Folder::Gel, [](Request& r, const Capture&) { r.paras = nullArg(); }, none()},
      {"BandLaneNullFrame", Fn::BandLane, Folder::Gel, [](Request& r, const Capture&) { r.frame = nullArg(); }, none()},
      {"BandLaneNullParas", Fn::BandLane, Folder::Gel, [](Request& r, const Capture&) { r.paras = nullArg(); }, none()},
      {"BandLaneNullModeStillMeasures", Fn::BandLane, Folder::Gel, [](Request& r, const Capture&) { r.mode = nullArg(); }, json()},
      {"CustomNullMode", Fn::Custom, Folder::Gel, [](Request& r, const Capture&) { r.mode = nullArg(); }, none()},
      {"CustomNullFrame", Fn::Custom, Folder::Gel, [](Request& r, const Capture&) { r.frame = nullArg(); }, none()},
      {"CustomNullDir", Fn::Custom, Folder::Gel, [](Request& r, const Capture&) { r.dir = nullArg(); }, error()},
      {"UpdateNullFrame", Fn::Update, Folder::Gel, [](Request& r, const Capture&) { r.frame = nullArg(); }, none()},
      {"UpdateNullParas", Fn::Update, Folder::Gel, [](Request& r, const Capture&) { r.paras = nullArg(); }, none()},
      {"RollingBallNullFrame", Fn::RollingBall, Folder::Gel, [](Request& r, const Capture&) { r.frame = nullArg(); }, none()},
      {"RollingBallNullParas", Fn::RollingBall, Folder::Gel, [](Request& r, const Capture&) { r.paras = nullArg(); }, none()},
      {"RegionNullRegions", Fn::Region, Folder::Gel, [](Request& r, const Capture&) { r.regions = nullArg(); }, none()},
      {"RegionNullParas", Fn::Region, Folder::Gel, [](Request& r, const Capture&) { r.paras = nullArg(); }, none()},
      {"RegionNullBackgroundIsTheWholeImage", Fn::Region, Folder::Gel, [](Request& r, const Capture&) { r.bg = nullArg(); }, json("cloud_region_list")},
      {"TpnNullMode", Fn::Tpn, Folder::Gel, [](Request& r, const Capture&) { r.mode = nullArg(); }, error()},
      {"TpnNullFrame", Fn::Tpn, Folder::Gel, [](Request& r, const Capture&) { r.frame = nullArg(); }, error()},
      {"TpnNullRequest", Fn::Tpn, Folder::Gel, [](Request& r, const Capture&) { r.tpn = nullArg(); }, error()},
      {"TpnNullParas", Fn::Tpn, Folder::Gel, [](Request& r, const Capture&) { r.paras = nullArg(); }, error()},
      {"TpnAllNull", Fn::Tpn, Folder::Gel, [](Request& r, const Capture&) { r = Request(); r.dir = nullArg(); r.mode = nullArg(); r.frame = nullArg(); r.tpn = nullArg(); r.paras = nullArg(); }, error()},
      {"ExportNullDir", Fn::Export, Folder::Gel, [](Request& r, const Capture&) { r.dir = nullArg(); }, refusedExport(-1)},
      {"ExportNullAttributes", Fn::Export, Folder::Gel, [](Request& r, const Capture&) { r.attributes = nullArg(); }, refusedExport(-1)},
      {"ExportNullOverlay", Fn::Export, Folder::Gel, [](Request& r, const Capture&) { r.overlay = nullArg(); }, refusedExport(-1)},
      {"ExportNullFrames", Fn::Export, Folder::Gel, [](Request& r, const Capture&) { r.frameList = nullArg(); }, refusedExport(-1)},
      {"ExportNullRegions", Fn::Export, Folder::Gel, [](Request& r, const Capture&) { r.regions = nullArg(); }, refusedExport(-1)},
      {"ExportNullParas", Fn::Export, Folder::Gel, [](Request& r, const Capture&) { r.paras = nullArg(); }, refusedExport(-1)},
      {"ExportNullTpnFrames", Fn::Export, Folder::Gel, [](Request& r, const Capture&) { r.tpnFrames = nullArg(); }, refusedExport(-1)},
      {"ExportNullMarkers", Fn::Export, Folder::Gel, [](Request& r, const Capture&) { r.markers = nullArg(); }, refusedExport(-1)},
      {"ExportNullTexts", Fn::Export, Folder::Gel, [](Request& r, const Capture&) { r.texts = nullArg(); }, refusedExport(-1)},
      {"ExportNullAnnotationsUnused", Fn::Export, Folder::Gel, [](Request& r, const Capture&) { r.annotations = nullArg(); }, exported()},
      {"ExportNullAnnotationsWanted", Fn::Export, Folder::Gel,
       [](Request& r, const Capture&) {
         r.annotations = nullArg();
         r.attributes = R"({"exportAttribute": {"format": 1, "dpi": 100, "height": 3.0, "width": 3.0, "exportAnnotation": true}})";
       },
       refusedExport(0)},
      {"ExportNullPlatformIsNotRead", Fn::Export, Folder::Gel, [](Request& r, const Capture&) { r.platform = nullArg(); }, exported()},
      {"VitNullSource", Fn::Vit, Folder::Gel, [](Request& r, const Capture&) { r.source = nullArg(); }, notConverted()},
      {"VitNullTarget", Fn::Vit, Folder::Gel, [](Request& r, const Capture&) { r.target = nullArg(); }, notConverted()},

      // Empty texts.
      {"BandLaneEmptyFrame", Fn::BandLane, Folder::Gel, [](Request& r, const Capture&) { r.frame = ""; }, none()},
      {"AutoEmptyMode", Fn::Auto, Folder::Gel, [](Request& r, const Capture&) { r.mode = ""; }, none()},
      {"RegionEmptyBackground", Fn::Region, Folder::Gel, [](Request& r, const Capture&) { r.bg = ""; }, none()},
      {"TpnEmptyRequest", Fn::Tpn, Folder::Gel, [](Request& r, const Capture&) { r.tpn = ""; }, error()},
      {"ExportEmptyAttributes", Fn::Export, Folder::Gel, [](Request& r, const Capture&) { r.attributes = ""; }, refusedExport(-1)},
      {"VitEmptyTarget", Fn::Vit, Folder::Gel, [](Request& r, const Capture&) { r.target = ""; }, notConverted()},

      // Texts that are no JSON.
      {"AutoInvalidParas", Fn::Auto, Folder::Gel, [](Request& r, const Capture&) { r.paras = "{\"ImageParas\": ["; }, none()},
      {"BandLaneInvalidParas", Fn::BandLane, Folder::Gel, [](Request& r, const Capture&) { r.paras = "{"; }, none()},
      {"CustomInvalidFrame", Fn::Custom, Folder::Gel, [](Request& r, const Capture&) { r.frame = "{\"analysisFrame\": }"; }, none()},
      {"UpdateInvalidFrame", Fn::Update, Folder::Gel, [](Request& r, const Capture&) { r.frame = "{"; }, none()},
      {"RollingBallInvalidFrame", Fn::RollingBall, Folder::Gel, [](Request& r, const Capture&) { r.frame = "nonsense"; }, none()},
      {"RegionInvalidRegions", Fn::Region, Folder::Gel, [](Request& r, const Capture&) { r.regions = "{\"region_list\": [}"; }, none()},
      {"RegionInvalidBackground", Fn::Region, Folder::Gel, [](Request& r, const Capture&) { r.bg = "{bgRegion}"; }, none()},
      {"TpnInvalidFrame", Fn::Tpn, Folder::Gel, [](Request& r, const Capture&) { r.frame = "["; }, error()},
      {"ExportInvalidOverlay", Fn::Export, Folder::Gel, [](Request& r, const Capture&) { r.overlay = "{"; }, refusedExport(-1)},
      {"ExportInvalidMarkers", Fn::Export, Folder::Gel, [](Request& r, const Capture&) { r.markers = "mw"; }, refusedExport(-1)},
      {"ExportInvalidAnnotationsWanted", Fn::Export, Folder::Gel,
       [](Request& r, const Capture&) {
         r.annotations = "{\"annotationAttribute\": [";
         r.attributes = R"({"exportAttribute": {"format": 1, "dpi": 100, "height": 3.0, "width": 3.0, "exportAnnotation": true}})";
       },
       refusedExport(0)},

      // Values of the wrong type.
      {"BandLaneTextForIntParameter", Fn::BandLane, Folder::Gel, parasEdit([](Json::Value& p) { p["img_max"] = "abc"; }), error()},
      {"BandLaneTextForCoordinate", Fn::BandLane, Folder::Gel, frameEdit([](Json::Value& f) { firstBand(f)["x1"] = "12"; }), error()},
      {"BandLaneFrameIsAnArray", Fn::BandLane, Folder::Gel, [](Request& r, const Capture&) { r.frame = "{\"analysisFrame\": [1, 2]}"; }, error()},
      {"BandLaneLaneListIsANumber", Fn::BandLane, Folder::Gel, frameEdit([](Json::Value& f) { f["roiList"] = 7; }), json()},
      {"BandLaneParameterListIsAnObject", Fn::BandLane, Folder::Gel, [](Request& r, const Capture&) { r.paras = "{\"ImageParas\": {\"a\": 1}}"; }, error()},
      {"AutoParameterListIsANumber", Fn::Auto, Folder::Gel, [](Request& r, const Capture&) { r.paras = "{\"ImageParas\": 5}"; }, error()},
      {"CustomFrameIsAText", Fn::Custom, Folder::Gel, [](Request& r, const Capture&) { r.frame = "{\"analysisFrame\": \"frame\"}"; }, error()},
      {"RegionTextForBool", Fn::Region, Folder::Gel, [](Request& r, const Capture&) { r.regions = R"({"region_list": [{"circle_b": "yes"}]})"; }, error()},
      {"RegionBackgroundIsAText", Fn::Region, Folder::Gel, [](Request& r, const Capture&) { r.bg = R"({"bgRegion": "whole"})"; }, error()},
      {"RegionBackgroundRootIsAnArray", Fn::Region, Folder::Gel, [](Request& r, const Capture&) { r.bg = "[]"; }, error()},
      {"RollingBallRadiusIsAnObject", Fn::RollingBall, Folder::Gel, frameEdit([](Json::Value& f) { f["rollingBall"][0]["radius"]["r"] = 1; }), error()},
      {"TpnTextForChannel", Fn::Tpn, Folder::Gel,
       [](Request& r, const Capture&) {
         Json::Value t = parse(r.tpn.text);
         t["frameList"][0]["channel"] = "ch0";
         r.tpn = toText(t);
       },
       error()},
      {"TpnNoNamedLanes", Fn::Tpn, Folder::Gel, [](Request& r, const Capture&) { r.tpn = R"({"frameList": [{"channel": 0}]})"; }, json()},
      {"ExportTextForDpi", Fn::Export, Folder::Gel, [](Request& r, const Capture&) { r.attributes = R"({"exportAttribute": {"dpi": "high"}})"; }, refusedExport(-1)},
      {"ExportTextInOverlayList", Fn::Export, Folder::Gel, [](Request& r, const Capture&) { r.overlay = R"({"overlayList": ["0"]})"; }, refusedExport(-1)},
      {"ExportAnnotationBoxIsAText", Fn::Export, Folder::Gel,
       [](Request& r, const Capture&) {
         r.annotations = R"({"annotationAttribute": [{"channel": 0, "Annotation": [{"roi": "box", "type": "line"}]}]})";
         r.attributes = R"({"exportAttribute": {"format": 1, "dpi": 100, "height": 3.0, "width": 3.0, "exportAnnotation": true}})";
       },
       refusedExport(-1)},

      // Negative and huge numbers.
      {"BandLaneNegativeCoordinate", Fn::BandLane, Folder::Gel, frameEdit([](Json::Value& f) { firstBand(f)["x1"] = -1; }), error()},
      {"BandLaneCoordinateBeyondUnsigned", Fn::BandLane, Folder::Gel, frameEdit([](Json::Value& f) { firstBand(f)["y2"] = Json::UInt64(4294967296ULL); }), error()},
      {"BandLaneCoordinateOfAllOnes", Fn::BandLane, Folder::Gel, frameEdit([](Json::Value& f) { firstBand(f)["x2"] = 4294967295u; }), error()},
      {"BandLaneHugeRealCoordinate", Fn::BandLane, Folder::Gel, frameEdit([](Json::Value& f) { firstBand(f)["y1"] = 1e30; }), error()},
      {"BandLaneHugeRange", Fn::BandLane, Folder::Gel, parasEdit([](Json::Value& p) { p["img_max"] = 1e30; }), error()},
      {"BandLaneInfiniteAngle", Fn::BandLane, Folder::Gel, parasEdit([](Json::Value& p) { p["img_angle"] = 1e300; }), error()},
      {"BandLaneHugeLaneWidth", Fn::BandLane, Folder::Gel, frameEdit([](Json::Value& f) { firstLane(f)["width"] = 4294967295u; }), json()},
      {"UpdateHugeLaneWidth", Fn::Update, Folder::Gel,
       frameEdit([](Json::Value& f) {
         firstLane(f)["update_flag"] = true;
         firstLane(f)["width"] = 2147483647u;
       }),
       json()},
      {"CustomHugeFrame", Fn::Custom, Folder::Gel,
       frameEdit([](Json::Value& f) {
         f["x2"] = 4294967295u;
         f["y2"] = 4294967295u;
       }),
       error()},
      {"RegionHugeCircle", Fn::Region, Folder::Gel,
       [](Request& r, const Capture&) {
         r.regions = R"({"region_list": [{"circle_b": true, "channel": 0, "x": 4000000000, "y": 4000000000, "circle_radius": 4294967295}]})";
       },
       json("cloud_region_list")},
      {"RegionHugeBackgroundCircle", Fn::Region, Folder::Gel,
       [](Request& r, const Capture&) { r.bg = R"({"bgRegion": {"circle_b": true, "x": 60, "y": 50, "circle_radius": 4294967295}})"; },
       json("cloud_region_list")},
      {"RollingBallHugeRadius", Fn::RollingBall, Folder::Gel,
       frameEdit([](Json::Value& f) {
         f["rollingBall"][0]["channel"] = 0;
         f["rollingBall"][0]["radius"] = 4294967295u;
       }),
       json()},
      {"TpnVerticalRangeBeyondTheImage", Fn::Tpn, Folder::Gel,
       [](Request& r, const Capture&) {
         Json::Value t = parse(r.tpn.text);
         for (Json::Value& lane : t["frameList"][0]["normalizeLanes"]) {
           lane["laneVolTop"]["y1"] = 4000000000u;
           lane["laneVolBottom"]["y2"] = 4294967295u;
         }
         r.tpn = toText(t);
       },
       json()},
      {"ExportHugePrintSize", Fn::Export, Folder::Gel,
       [](Request& r, const Capture&) {
         r.attributes = R"({"exportAttribute": {"format": 1, "dpi": 4294967295, "height": 1e30, "width": 1e30}})";
       },
       refusedExport(-1)},
      {"ExportNegativePrintSize", Fn::Export, Folder::Gel,
       [](Request& r, const Capture&) { r.attributes = R"({"exportAttribute": {"format": 1, "dpi": 100, "height": -3.0, "width": -3.0}})"; },
       refusedExport(-1)},
      {"ExportZeroPrintSize", Fn::Export, Folder::Gel,
       [](Request& r, const Capture&) { r.attributes = R"({"exportAttribute": {"format": 3}})"; }, refusedExport(-1)},
      {"ExportChannelBeyondTheList", Fn::Export, Folder::Gel, [](Request& r, const Capture&) { r.overlay = R"({"overlayList": [5]})"; }, refusedExport(-1)},
      {"ExportMergeOfNoChannel", Fn::Export, Folder::TwoChannels,
       [](Request& r, const Capture&) {
         r.mode = "chemi";
         r.overlay = R"({"overlayList": []})";
         r.attributes = R"({"exportAttribute": {"format": 1, "channelSelection": 1, "dpi": 100, "height": 3.0, "width": 3.0}})";
       },
       refusedExport(-1)},

      // Deeply nested arrays: the reader stops at its depth limit with its own error (an
      // "error" answer, not a refusal), or the decoder finds the wrong shape.
      {"BandLaneDeeplyNestedFrame", Fn::BandLane, Folder::Gel, [](Request& r, const Capture&) { r.frame = nested(100000); }, error()},
      {"AutoDeeplyNestedParas", Fn::Auto, Folder::Gel, [](Request& r, const Capture&) { r.paras = "{\"ImageParas\": " + nested(100000) + "}"; }, error()},
      {"TpnDeeplyNestedRequest", Fn::Tpn, Folder::Gel, [](Request& r, const Capture&) { r.tpn = nested(100000); }, error()},
      {"ExportDeeplyNestedTexts", Fn::Export, Folder::Gel, [](Request& r, const Capture&) { r.texts = nested(100000); }, refusedExport(-1)},
      {"RegionNestedArraysAsRegions", Fn::Region, Folder::Gel, [](Request& r, const Capture&) { r.regions = "{\"region_list\": " + nested(500) + "}"; }, error()},
      {"UpdateNestedArraysAsLanes", Fn::Update, Folder::Gel, frameEdit([](Json::Value& f) { f["roiList"] = parse(nested(500)); }), error()},

      // Megabyte texts.
      {"BandLaneMegabyteUid", Fn::BandLane, Folder::Gel, frameEdit([](Json::Value& f) { firstBand(f)["uid"] = megabyte(); }), json()},
      {"AutoMegabyteMode", Fn::Auto, Folder::Gel, [](Request& r, const Capture&) { r.mode = megabyte(); }, none()},
      {"AutoMegabyteDir", Fn::Auto, Folder::Gel, [](Request& r, const Capture&) { r.dir = megabyte(); }, error()},
      {"RegionMegabyteName", Fn::Region, Folder::Gel,
       [](Request& r, const Capture&) {
         r.regions = "{\"region_list\": [{\"circle_b\": false, \"channel\": 0, \"regionName\": \"" + megabyte() +
                     "\", \"x1\": 10, \"y1\": 10, \"x2\": 30, \"y2\": 30}]}";
       },
       json("cloud_region_list")},
      {"ExportMegabyteAnnotation", Fn::Export, Folder::Gel,
       [](Request& r, const Capture&) {
         r.annotations = R"({"annotationAttribute": [{"channel": 0, "Annotation": [{"roi": {"x1": 5, "y1": 5, "x2": 40, "y2": 20},)"
                         R"( "type": "text", "textColor": "#FF0000", "exportTextSize": 12, "fillColor": "#FFFFFF", "text": [")" +
                         megabyte('w') + "\"]}]}]}";
         r.attributes = R"({"exportAttribute": {"format": 1, "dpi": 100, "height": 3.0, "width": 3.0, "exportAnnotation": true}})";
       },
       exported()},
      {"TpnMegabyteJunk", Fn::Tpn, Folder::Gel, [](Request& r, const Capture&) { r.tpn = megabyte('{'); }, error()},

      // Frames, lanes, bands and regions outside the image.
      {"BandLaneBandOutsideTheImage", Fn::BandLane, Folder::Gel,
       frameEdit([](Json::Value& f) {
         firstBand(f)["x1"] = 500;
         firstBand(f)["x2"] = 520;
       }),
       error()},
      {"BandLaneLaneOutsideTheImage", Fn::BandLane, Folder::Gel,
       frameEdit([](Json::Value& f) {
         firstLane(f)["x1"] = 5000;
         firstLane(f)["x2"] = 5000;
       }),
       json()},
      {"CustomFrameOutsideTheImage", Fn::Custom, Folder::Gel,
       frameEdit([](Json::Value& f) {
         f["x1"] = 500;
         f["y1"] = 500;
         f["x2"] = 600;
         f["y2"] = 600;
       }),
       error()},
      {"CustomFrameReachingBeyondTheImage", Fn::Custom, Folder::Gel, frameEdit([](Json::Value& f) { f["x2"] = 5000; f["y2"] = 5000; }), json()},
      {"UpdateLaneOutsideTheImage", Fn::Update, Folder::Gel,
       frameEdit([](Json::Value& f) {
         firstLane(f)["update_flag"] = true;
         firstLane(f)["x1"] = 900;
         firstLane(f)["x2"] = 900;
         firstLane(f)["y1"] = 700;
         firstLane(f)["y2"] = 800;
       }),
       json()},
      {"RollingBallBandOutsideTheImage", Fn::RollingBall, Folder::Gel, frameEdit([](Json::Value& f) { firstBand(f)["y2"] = 400; }), error()},
      {"RollingBallFrameOutsideTheImage", Fn::RollingBall, Folder::Gel, frameEdit([](Json::Value& f) { f["x1"] = 300; f["x2"] = 400; }), error()},
      {"RollingBallLaneOutsideTheImage", Fn::RollingBall, Folder::Gel,
       frameEdit([](Json::Value& f) {
         firstLane(f)["x1"] = 3000;
         firstLane(f)["x2"] = 3000;
         firstLane(f)["y2"] = 3000;
       }),
       json()},
      {"RegionRectangleOutsideTheImage", Fn::Region, Folder::Gel,
       [](Request& r, const Capture&) { r.regions = R"({"region_list": [{"circle_b": false, "channel": 0, "x1": 200, "y1": 10, "x2": 230, "y2": 30}]})"; },
       error()},
      {"RegionCircleOutsideTheImage", Fn::Region, Folder::Gel,
       [](Request& r, const Capture&) { r.regions = R"({"region_list": [{"circle_b": true, "channel": 0, "x": 900, "y": 900, "circle_radius": 10}]})"; },
       json("cloud_region_list")},
      {"RegionBackgroundRectangleOutsideTheImage", Fn::Region, Folder::Gel,
       [](Request& r, const Capture&) { r.bg = R"({"bgRegion": {"circle_b": false, "x1": 100, "y1": 90, "x2": 300, "y2": 300}})"; }, error()},
      {"RegionBackgroundCircleOutsideTheImage", Fn::Region, Folder::Gel,
       [](Request& r, const Capture&) { r.bg = R"({"bgRegion": {"circle_b": true, "x": 900, "y": 900, "circle_radius": 5}})"; }, error()},
      {"TpnLanesOutsideTheImage", Fn::Tpn, Folder::Gel,
       [](Request& r, const Capture& c) {
         Json::Value doc = c.frameDoc;
         Json::Value t = parse(r.tpn.text);
         for (int j = 0; j < 2; ++j) {
           Json::Value& lane = doc["analysisFrame"]["roiList"][j]["lane"];
           lane["x1"] = lane["x2"] = 700 + j;
           t["frameList"][0]["normalizeLanes"][j]["laneRoi"]["x1"] = 700 + j;
           t["frameList"][0]["normalizeLanes"][j]["laneRoi"]["x2"] = 700 + j;
         }
         r.frame = toText(doc);
         r.tpn = toText(t);
       },
       json()},
      {"ExportObjectsOutsideTheImage", Fn::Export, Folder::Gel,
       [](Request& r, const Capture& c) {
         Json::Value doc = c.frameDoc;
         doc["analysisFrame"]["x2"] = 4000;
         firstLane(doc["analysisFrame"])["x1"] = 3000;
         firstBand(doc["analysisFrame"])["y2"] = 3000;
         r.frameList = "[" + toText(doc) + "]";
         r.regions = R"({"region_list": [{"circle_b": true, "channel": 0, "x": 900, "y": 900, "circle_radius": 10}]})";
       },
       exported()},

      // Zero-width lanes and bands.
      {"BandLaneZeroWidthBand", Fn::BandLane, Folder::Gel, frameEdit([](Json::Value& f) { firstBand(f)["x2"] = firstBand(f)["x1"].asUInt() - 1; }), error()},
      {"BandLaneZeroWidthLane", Fn::BandLane, Folder::Gel, frameEdit([](Json::Value& f) { firstLane(f)["width"] = 0; }), json()},
      {"UpdateZeroWidthLane", Fn::Update, Folder::Gel,
       frameEdit([](Json::Value& f) {
         firstLane(f)["update_flag"] = true;
         firstLane(f)["width"] = 0;
       }),
       json()},
      {"RollingBallZeroWidthLane", Fn::RollingBall, Folder::Gel, frameEdit([](Json::Value& f) { firstLane(f)["width"] = 0; }), json()},
      {"TpnZeroWidthLanes", Fn::Tpn, Folder::Gel,
       frameEdit([](Json::Value& f) {
         for (Json::Value& entry : f["roiList"]) entry["lane"]["width"] = 0;
       }),
       json()},
      {"ExportZeroWidthAndFlatLanes", Fn::Export, Folder::Gel,
       [](Request& r, const Capture& c) {
         Json::Value doc = c.frameDoc;
         Json::Value& f = doc["analysisFrame"];
         firstLane(f)["width"] = 0;
         firstBand(f)["x2"] = firstBand(f)["x1"].asUInt() - 1;
         f["roiList"][1]["lane"]["y2"] = f["roiList"][1]["lane"]["y1"];
         r.frameList = "[" + toText(doc) + "]";
         r.regions = R"({"region_list": [{"circle_b": true, "channel": 0, "x": 30, "y": 10, "circle_radius": 0}]})";
       },
       exported()},
      {"RegionZeroSizeRectangle", Fn::Region, Folder::Gel,
       [](Request& r, const Capture&) { r.regions = R"({"region_list": [{"circle_b": false, "channel": 0, "x1": 30, "y1": 10, "x2": 29, "y2": 30}]})"; },
       error()},
      {"RegionZeroRadiusCircle", Fn::Region, Folder::Gel,
       [](Request& r, const Capture&) { r.regions = R"({"region_list": [{"circle_b": true, "channel": 0, "x": 30, "y": 10, "circle_radius": 0}]})"; },
       json("cloud_region_list")},
      {"RegionEmptyBackgroundRectangle", Fn::Region, Folder::Gel,
       [](Request& r, const Capture&) { r.bg = R"({"bgRegion": {"circle_b": false, "x1": 20, "y1": 20, "x2": 10, "y2": 10}})"; }, error()},

      // Lanes with y1 = y2.
      {"BandLaneFlatLane", Fn::BandLane, Folder::Gel, frameEdit([](Json::Value& f) { firstLane(f)["y2"] = firstLane(f)["y1"]; }), json()},
      {"UpdateFlatLane", Fn::Update, Folder::Gel,
       frameEdit([](Json::Value& f) {
         firstLane(f)["update_flag"] = true;
         firstLane(f)["y2"] = firstLane(f)["y1"];
       }),
       json()},
      {"RollingBallFlatLane", Fn::RollingBall, Folder::Gel, frameEdit([](Json::Value& f) { firstLane(f)["y2"] = firstLane(f)["y1"]; }), json()},
      {"TpnFlatLanes", Fn::Tpn, Folder::Gel,
       [](Request& r, const Capture& c) {
         Json::Value doc = c.frameDoc;
         Json::Value t = parse(r.tpn.text);
         for (int j = 0; j < 2; ++j) {
           Json::Value& lane = doc["analysisFrame"]["roiList"][j]["lane"];
           lane["y2"] = lane["y1"];
           t["frameList"][0]["normalizeLanes"][j]["laneRoi"]["y2"] = lane["y1"];
         }
         r.frame = toText(doc);
         r.tpn = toText(t);
       },
       json()},

      // A missing or empty capture folder.
      // Without a channel file there is nothing to measure: no call answers with the
      // request's own values.
      {"AutoMissingFolder", Fn::Auto, Folder::Missing, kNone, error()},
      {"CustomMissingFolder", Fn::Custom, Folder::Missing, kNone, error()},
      {"UpdateMissingFolder", Fn::Update, Folder::Missing, kNone, error()},
      {"BandLaneMissingFolder", Fn::BandLane, Folder::Missing, kNone, error()},
      {"RollingBallMissingFolder", Fn::RollingBall, Folder::Missing, kNone, error()},
      {"RegionMissingFolder", Fn::Region, Folder::Missing, kNone, error()},
      {"TpnMissingFolder", Fn::Tpn, Folder::Missing, kNone, error()},
      {"ExportMissingFolder", Fn::Export, Folder::Missing, kNone, refusedExport(-1)},
      {"VitMissingSource", Fn::Vit, Folder::Missing, kNone, notConverted()},
      {"VitTargetInMissingFolder", Fn::Vit, Folder::Gel, [](Request& r, const Capture& c) { r.target = c.root.file("nowhere/x.tif"); }, notConverted()},
      {"BandLaneEmptyFolder", Fn::BandLane, Folder::Empty, kNone, error()},
      {"RegionEmptyFolder", Fn::Region, Folder::Empty, kNone, error()},
      {"RollingBallEmptyFolder", Fn::RollingBall, Folder::Empty, kNone, error()},
      {"UpdateEmptyFolder", Fn::Update, Folder::Empty, frameEdit([](Json::Value& f) { firstLane(f)["update_flag"] = true; }), error()},

      // Channel files that are no image, empty, or a single pixel.
      {"AutoEmptyCh0", Fn::Auto, Folder::EmptyCh0, kNone, error()},
      {"BandLaneEmptyCh0", Fn::BandLane, Folder::EmptyCh0, kNone, error()},
      {"RegionTextCh0", Fn::Region, Folder::TextCh0, kNone, error()},
      {"RollingBallTextCh0", Fn::RollingBall, Folder::TextCh0, kNone, error()},
      {"TpnTextCh0", Fn::Tpn, Folder::TextCh0, kNone, error()},
      {"ExportTextCh0", Fn::Export, Folder::TextCh0, kNone, refusedExport(-1)},
      {"VitTextSource", Fn::Vit, Folder::TextCh0, kNone, notConverted()},
      {"AutoOnePixel", Fn::Auto, Folder::OnePixel, kNone, error()},
      {"CustomOnePixel", Fn::Custom, Folder::OnePixel, kNone, error()},
      {"BandLaneOnePixel", Fn::BandLane, Folder::OnePixel, kNone, error()},
      {"BandLaneOnePixelBand", Fn::BandLane, Folder::OnePixel,
       frameEdit([](Json::Value& f) {
         f["roiList"].resize(1);
         firstBand(f)["x1"] = firstBand(f)["y1"] = firstBand(f)["x2"] = firstBand(f)["y2"] = 0;
         f["roiList"][0]["bands"].resize(1);
       }),
       json()},
      {"RegionOnePixel", Fn::Region, Folder::OnePixel,
       [](Request& r, const Capture&) {
         r.regions = R"({"region_list": [{"circle_b": true, "channel": 0, "x": 0, "y": 0, "circle_radius": 3}]})";
         r.bg = nullArg();
       },
       json("cloud_region_list")},
      {"ExportOnePixel", Fn::Export, Folder::OnePixel, kNone, exported()},
      {"VitOnePixel", Fn::Vit, Folder::OnePixel, kNone, converted()},

      // Rotating works on a square of the picture's diagonal: for this picture 80 GB, refused
      // before anything is allocated.
      {"BandLaneRotationOfAThinPicture", Fn::BandLane, Folder::Thin, parasEdit([](Json::Value& p) { p["img_angle"] = 10.0; }), error()},
      {"ExportRotationOfAThinPicture", Fn::Export, Folder::Thin, parasEdit([](Json::Value& p) { p["img_angle"] = 10.0; }), refusedExport(-1)},

      // Channels of different sizes.
      {"AutoSizesDiffer", Fn::Auto, Folder::SizesDiffer, [](Request& r, const Capture&) { r.mode = "chemi"; }, error()},
      {"CustomSizesDiffer", Fn::Custom, Folder::SizesDiffer, [](Request& r, const Capture&) { r.mode = "chemi"; }, error()},
      {"UpdateSizesDiffer", Fn::Update, Folder::SizesDiffer,
       [](Request& r, const Capture& c) {
         r.mode = "chemi";
         frameEdit([](Json::Value& f) { firstLane(f)["update_flag"] = true; })(r, c);
       },
       error()},
      {"ExportMergeOfSizesThatDiffer", Fn::Export, Folder::SizesDiffer,
       [](Request& r, const Capture&) {
         r.mode = "chemi";
         r.overlay = R"({"overlayList": [0, 1]})";
         r.attributes = R"({"exportAttribute": {"format": 1, "channelSelection": 1, "dpi": 100, "height": 3.0, "width": 3.0}})";
       },
       refusedExport(-1)},

      // More channel files than parameter records, and the reverse.
      {"AutoMoreFilesThanParameters", Fn::Auto, Folder::TwoChannels, [](Request& r, const Capture&) { r.mode = "chemi"; r.paras = synth::imageParasJson(1); }, error()},
      {"AutoMoreParametersThanFiles", Fn::Auto, Folder::Gel, [](Request& r, const Capture&) { r.paras = synth::imageParasJson(3); }, error()},
      {"BandLaneMoreFilesThanParameters", Fn::BandLane, Folder::TwoChannels, [](Request& r, const Capture&) { r.mode = "chemi"; r.paras = synth::imageParasJson(1); }, error()},
      {"UpdateMoreParametersThanFiles", Fn::Update, Folder::Gel, [](Request& r, const Capture&) { r.paras = synth::imageParasJson(2); }, error()},
      {"RegionMoreFilesThanParameters", Fn::Region, Folder::TwoChannels, [](Request& r, const Capture&) { r.mode = "universal"; r.paras = synth::imageParasJson(1); }, error()},
      {"TpnChannelBeyondTheFiles", Fn::Tpn, Folder::Gel,
       [](Request& r, const Capture&) {
         Json::Value t = parse(r.tpn.text);
         t["frameList"][0]["channel"] = 3;
         r.tpn = toText(t);
       },
       error()},
      {"ExportMoreFilesThanParameters", Fn::Export, Folder::TwoChannels, [](Request& r, const Capture&) { r.paras = synth::imageParasJson(1); }, refusedExport(-1)},
      {"ExportMoreParametersThanFiles", Fn::Export, Folder::Gel, [](Request& r, const Capture&) { r.paras = synth::imageParasJson(2); }, refusedExport(-1)},

      // A capture folder the caller may read but not write.
      {"BandLaneReadOnlyFolder", Fn::BandLane, Folder::ReadOnly, kNone, json(), true},
      {"BandLaneReadOnlyFolderWithAFlip", Fn::BandLane, Folder::ReadOnly, parasEdit([](Json::Value& p) { p["img_flip_h"] = true; }), error(), true},
      {"RegionReadOnlyFolderWithARotation", Fn::Region, Folder::ReadOnly, parasEdit([](Json::Value& p) { p["img_angle"] = 12.5; }), error(), true},
      {"ExportReadOnlyFolder", Fn::Export, Folder::ReadOnly, kNone, refusedExport(-1), true},
      {"VitIntoReadOnlyFolder", Fn::Vit, Folder::ReadOnly, [](Request& r, const Capture& c) { r.target = c.dir + "/ch9.tif"; }, notConverted(), true},
  };
  return all;
}

// ---- the child -----------------------------------------------------------------------------

constexpr uid_t kNobody = 65534;

// Readable (and its parent passable) for everyone, writable for no one but root.
void makeReadOnly(const std::string& dir) {
  for (const fs::directory_entry& e : fs::directory_iterator(dir)) ::chmod(e.path().c_str(), 0444);
  ::chmod(dir.c_str(), 0555);
  ::chmod(fs::path(dir).parent_path().c_str(), 0755);
}

// Runs the case and reports on standard error what went wrong; true when nothing did.
bool runCase(const Case& c) {
  Capture capture(c.folder);
  Request request = capture.request(c.folder);
  c.edit(request, capture);
  if (c.folder == Folder::ReadOnly) makeReadOnly(capture.dir);
  const auto before = snapshot(capture.dir);
  const std::string target = request.target.text;
  const bool hadTarget = fs::exists(target);

  // Root may write anywhere: act as an ordinary user for the call (and become root again
  // for the clean-up).
  const bool drop = c.dropPrivileges && ::geteuid() == 0;
  StdoutCapture out;
  if (drop && ::seteuid(kNobody) != 0) {
    std::cerr << "cannot drop privileges\n";
    return false;
  }
  const Answer answer = call(c.fn, request);
  const std::string log = out.finish();
  if (drop && ::seteuid(0) != 0) std::cerr << "cannot regain privileges\n";

  std::string problem = compare(answer, c.expected);
  // Only a completed export writes into the capture (its "output" folder); no request here
  // flips or rotates a channel unless it fails.
  if (problem.empty() && (c.expected.failed || c.fn != Fn::Export) && snapshot(capture.dir) != before) {
    problem = c.expected.failed ? "the failed call changed the capture's files"
                                : "the call changed the capture's files";
  }
  if (problem.empty() && c.expected.failed && c.fn == Fn::Vit && !hadTarget && fs::exists(target)) {
    problem = "the failed conversion wrote its target";
  }
  ::chmod(capture.dir.c_str(), 0755);
  if (problem.empty()) return true;
  const std::size_t tail = log.size() > 3000 ? log.size() - 3000 : 0;
  std::cerr << c.name << ": " << problem << "\n--- end of the library's log ---\n" << log.substr(tail);
  return false;
}

class BadInput : public ::testing::TestWithParam<Case> {};

TEST_P(BadInput, AnswersAsDocumentedAndKeepsTheCapture) {
  GTEST_FLAG_SET(death_test_style, "threadsafe");
  EXPECT_EXIT(std::exit(runCase(GetParam()) ? 0 : 1), ::testing::ExitedWithCode(0), "");
}

INSTANTIATE_TEST_SUITE_P(Matrix, BadInput, ::testing::ValuesIn(cases()),
                         [](const ::testing::TestParamInfo<Case>& info) { return std::string(info.param.name); });

}  // namespace
}  // namespace viraduve
