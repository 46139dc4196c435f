// The demo subcommand: capture, automatic analysis, band table, answer file and an exported
// picture, with every file it wrote named at the end.
#include "demo.h"

#include <stdlib.h>

#include <chrono>
#include <cmath>
#include <cstdio>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <iostream>
#include <memory>
#include <string>
#include <vector>

#include <json/json.h>
#include <opencv2/imgcodecs.hpp>
#include <viraduve/viraduve.h>

#include "documents.h"
#include "library_call.h"
#include "summary.h"
#include "synth.h"

#ifndef VIRADUVE_DEMO_GEL_DIR
#define VIRADUVE_DEMO_GEL_DIR ""
#endif

namespace viraduve {
namespace cli {

namespace fs = std::filesystem;

namespace {

struct ResultDeleter {
  void operator()(char* p) const { releaseResult(p); }
};

double secondsSince(std::chrono::steady_clock::time_point start) {
  return std::chrono::duration<double>(std::chrono::steady_clock::now() - start).count();
}

// A western blot as a chemiluminescence imager records it. Channel 0 is the membrane under
// white light (dark on bright), where only the prestained size marker of lane 1 shows;
// channel 1 is the chemiluminescence (bright on dark): in every lane the target protein, in
// a dilution series, and a loading control of nearly equal amount.
void writeSyntheticBlot(const fs::path& dir) {
  const int width = 1024, height = 768, lanes = 8;
  const double dilution[lanes] = {1.0, 0.8, 0.64, 0.5, 0.4, 0.32, 0.25, 0.2};
  const double control[lanes] = {1.0, 0.95, 1.05, 0.9, 1.0, 1.1, 0.97, 1.02};
  const double markerRows[] = {70.0, 140.0, 300.0, 360.0, 500.0, 580.0};
  const cv::Rect membrane(64, 48, 896, 672);
  const double spacing = membrane.width / static_cast<double>(lanes);
  for (int channel = 0; channel < 2; ++channel) {
    const bool whiteLight = channel == 0;
    synth::CaptureSpec plan;
    plan.width = width;
    plan.height = height;
    plan.background = whiteLight ? 6000.0 : 1500.0;
    plan.slope = 2.0;
    plan.noiseSigma = whiteLight ? 400.0 : 250.0;
    plan.darkOnBright = whiteLight;
    plan.seed = 11 + channel;
    synth::FrameSpec frame;
    frame.rect = membrane;
    frame.level = whiteLight ? 4000.0 : 800.0;
    for (int l = 0; l < lanes; ++l) {
      synth::LaneSpec lane;
      lane.centre = std::floor(spacing * (l + 0.5));
      lane.width = 71;
      if (whiteLight) {
        if (l == 0)
          for (double row : markerRows) lane.bands.push_back({row, 5.0, 1.6e7});
      } else {
        lane.bands.push_back({230.0, 7.0, 3.2e7 * dilution[l]});
        lane.bands.push_back({420.0, 8.0, 2.4e7 * control[l]});
      }
      frame.lanes.push_back(lane);
    }
    plan.frames.push_back(frame);
    std::vector<cv::Mat> pictures;
    synth::render(plan, pictures);
    const fs::path file = dir / ("ch" + std::to_string(channel) + ".tif");
    if (!cv::imwrite(file.string(), pictures.at(0)))
      throw std::runtime_error("cannot write " + file.string());
  }
}

void copyRealGel(const std::string& gel, const fs::path& dir) {
  const fs::path source = fs::path(gel) / "ch0.tif";
  std::error_code ec;
  if (!fs::is_regular_file(source, ec))
    throw UsageError("real gel not found: " + source.string() + " (give its folder with --gel)");
  // A copy, because an analysis may rewrite the channel files of the capture it is given.
  fs::copy_file(source, dir / "ch0.tif", fs::copy_options::overwrite_existing);
}

// The capture folder inside the working folder. Channel files of an earlier demo run are
// replaced; any other channel file there belongs to someone else and stops the demo.
fs::path prepareCaptureFolder(const fs::path& work, int channels) {
  const fs::path capture = work / "capture";
  std::error_code ec;
  fs::create_directories(capture, ec);
  if (ec) throw UsageError("cannot create folder " + capture.string() + ": " + ec.message());
  for (const std::string& name : channelFiles(capture.string())) {
    bool ours = false;
    for (int c = 0; c < channels; ++c) ours = ours || name == "ch" + std::to_string(c) + ".tif";
    if (!ours)
      throw UsageError(capture.string() + " holds other channel files (" + name +
                       "); choose another --out folder");
  }
  return capture;
}

fs::path workFolder(const std::string& out) {
  if (!out.empty()) {
    std::error_code ec;
    fs::create_directories(out, ec);
    if (ec || !fs::is_directory(out, ec)) throw UsageError("cannot use folder " + out);
    return fs::absolute(out);
  }
  std::error_code ec;
  std::string pattern = (fs::temp_directory_path(ec) / "viraduve-demo-XXXXXX").string();
  if (ec) pattern = "/tmp/viraduve-demo-XXXXXX";
  std::vector<char> name(pattern.begin(), pattern.end());
  name.push_back('\0');
  if (!mkdtemp(name.data())) throw UsageError("cannot create a temporary folder " + pattern);
  return fs::path(name.data());
}

// The default parameters of the folder, with a display that tells the two channels apart:
// the white-light picture inverted in grey (the marker shows bright on dark, like the
// signal), and the chemiluminescence in orange with a narrower display range, screened
// over it. Display settings only: the analysis reads neither colours nor inversion.
std::string demoImageParas(const fs::path& capture, const std::string& mode) {
  const std::string defaults = defaultImageParas(capture.string(), mode);
  if (channelFiles(capture.string()).size() < 2) return defaults;
  Json::Value root;
  Json::Reader().parse(defaults, root);
  Json::Value& paras = root["ImageParas"];
  paras[0]["img_invert"] = true;
  paras[1]["img_max"] = 32000;
  paras[1]["r"] = 255;
  paras[1]["g"] = 170;
  paras[1]["b"] = 0;
  Json::StreamWriterBuilder builder;
  builder["indentation"] = "";
  return Json::writeString(builder, root);
}

void writeFile(const fs::path& path, const std::string& text) {
  std::ofstream out(path, std::ios::binary | std::ios::trunc);
  out << text;
  if (!text.empty() && text.back() != '\n') out << '\n';
  out.flush();
  if (!out) throw std::runtime_error("cannot write " + path.string());
}

OutputOptions logTo(const fs::path& file, bool verbose) {
  OutputOptions options;
  if (verbose)
    options.verbose = true;
  else
    options.logFile = file.string();
  return options;
}

bool parseAnswer(const std::string& text, Json::Value& root) {
  Json::CharReaderBuilder builder;
  builder["allowSpecialFloats"] = true;
  std::unique_ptr<Json::CharReader> reader(builder.newCharReader());
  std::string errors;
  return reader->parse(text.data(), text.data() + text.size(), &root, &errors) &&
         root.isObject() && root["frameLanesBands"].isArray();
}

}  // namespace

bool isFramesAnswer(const std::string& text) {
  Json::Value root;
  return parseAnswer(text, root);
}

std::string exportFramesFromAnswer(const std::string& answer) {
  Json::Value root;
  if (!parseAnswer(answer, root)) throw std::runtime_error("the answer holds no frame list");
  Json::Value frames(Json::arrayValue);
  for (const Json::Value& entry : root["frameLanesBands"]) {
    Json::Value frame = entry["roi"];
    const bool openCorners = frame["x3"].asUInt() == 0 && frame["y3"].asUInt() == 0 &&
                             frame["x4"].asUInt() == 0 && frame["y4"].asUInt() == 0;
    if (openCorners) {
      frame["x3"] = frame["x2"];
      frame["y3"] = frame["y1"];
      frame["x4"] = frame["x1"];
      frame["y4"] = frame["y2"];
    }
    frame["roiList"] = entry["lanes"];
    Json::Value item(Json::objectValue);
    item["analysisFrame"] = frame;
    frames.append(item);
  }
  // Plain JSON: the export's reader takes no NaN tokens (a NaN measure becomes null, read as 0).
  Json::StreamWriterBuilder writerBuilder;
  writerBuilder["indentation"] = "";
  return Json::writeString(writerBuilder, frames);
}

int runDemo(const DemoOptions& options) {
  const std::string mode = options.real ? "uv" : "chemi";
  const std::string gel = options.gel.empty() ? VIRADUVE_DEMO_GEL_DIR : options.gel;
  const int channels = options.real ? 1 : 2;

  const fs::path work = workFolder(options.out);
  const fs::path capture = prepareCaptureFolder(work, channels);
  if (options.real) {
    copyRealGel(gel, capture);
    std::cout << "Capture: a real agarose DNA gel under UV light (4 ladder lanes), copied to "
              << capture.string() << "\n";
  } else {
    writeSyntheticBlot(capture);
    std::cout << "Capture: a synthetic western blot, 8 lanes (channel 0: the membrane under white "
                 "light with a size marker in lane 1; channel 1: chemiluminescence of a target "
                 "protein in a dilution series and a loading control), written to "
              << capture.string() << "\n";
  }
  std::cout << "Running the automatic analysis (mode \"" << mode << "\") ..." << std::endl;

  const fs::path answerFile = work / "answer.json";
  const fs::path analysisLog = work / "analysis.log";
  const fs::path exportLog = work / "export.log";
  const std::string paras = demoImageParas(capture, mode);
  const auto seeLog = [&](const fs::path& log) {
    return options.verbose ? std::string("see the log above") : "see " + log.string();
  };

  auto start = std::chrono::steady_clock::now();
  std::unique_ptr<char, ResultDeleter> answer;
  {
    StdoutRedirect redirect(logTo(analysisLog, options.verbose));
    answer.reset(getAutoAnalysisFrameDetection(capture.string().c_str(), mode.c_str(), "",
                                               paras.c_str()));
  }
  const double analysisSeconds = secondsSince(start);
  if (!answer) {
    reportError("the library refused the demo request (" + seeLog(analysisLog) + ")");
    return kExitRefused;
  }
  if (std::strcmp(answer.get(), "error") == 0) {
    reportError("the analysis failed (" + seeLog(analysisLog) + ")");
    return kExitError;
  }
  const std::string text = answer.get();
  answer.reset();
  writeFile(answerFile, text);
  std::cout << "\n" << summariseAnswer(text) << "\n";

  start = std::chrono::steady_clock::now();
  const std::string frames = exportFramesFromAnswer(text);
  // One merged picture ("overlay") at the capture's pixel size, with the layers drawn.
  const std::string attributes =
      defaultExportAttributes(capture.string(), true, false, false, 3);
  const std::string overlay = allChannelsOverlay(capture.string());
  int status;
  {
    StdoutRedirect redirect(logTo(exportLog, options.verbose));
    status = convertAndExportImage(capture.string().c_str(), frames.c_str(),
                                   "{\"region_list\": []}", mode.c_str(), nullptr,
                                   attributes.c_str(), paras.c_str(), overlay.c_str(),
                                   "{\"annotationAttribute\": []}", 0, "[]",
                                   "{\"mwMarkerFrame\": []}", "[]", "Darwin");
  }
  const double exportSeconds = secondsSince(start);
  const fs::path picture = capture / "output" / "overlay.png";
  std::error_code ec;
  if (status != 0 || !fs::is_regular_file(picture, ec)) {
    reportError("the export failed (status " + std::to_string(status) + ", " +
                seeLog(exportLog) + ")");
    return kExitError;
  }

  char timing[160];
  std::snprintf(timing, sizeof timing, "Analysis took %.2f s, export %.2f s.\n", analysisSeconds,
                exportSeconds);
  std::cout << timing << "Files:\n"
            << "  capture          " << capture.string() << "\n"
            << "  answer (JSON)    " << answerFile.string() << "\n"
            << "  exported picture " << picture.string() << "\n";
  if (!options.verbose)
    std::cout << "  library log      " << analysisLog.string() << ", " << exportLog.string()
              << "\n";
  std::cout.flush();
  return kExitAnswer;
}

}  // namespace cli
}  // namespace viraduve
