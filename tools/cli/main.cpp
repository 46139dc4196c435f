// viraduve: the command-line host of the library's C API, one subcommand per entry point,
// plus `synth`, which writes a synthetic capture with its true frame, and `demo`.
//
// Exit status: 0 with an answer, 1 when the library answered "error" or failed, 2 when the
// request was refused (by the library, or by this program before calling it).
#include <filesystem>
#include <fstream>
#include <functional>
#include <iostream>
#include <map>
#include <string>

#include <CLI/CLI.hpp>
#include <viraduve/viraduve.h>

#include "demo.h"
#include "documents.h"
#include "library_call.h"
#include "synth.h"

namespace fs = std::filesystem;
using namespace viraduve::cli;

namespace {

// Arguments shared by the analysis subcommands.
struct Request {
  std::string dir;
  std::string mode;
  std::string paras;  // option value as given; empty: defaults for the folder's channels
  OutputOptions output;

  // The image parameters document, after the folder has been checked.
  std::string imageParas() const {
    requireFolder(dir);
    requireChannelFiles(dir);
    return paras.empty() ? defaultImageParas(dir, mode) : loadDocument("--paras", paras);
  }
};

void addRequestArguments(CLI::App* cmd, Request& r, bool withSummary) {
  cmd->add_option("folder", r.dir, "capture folder holding ch0.tif, ch1.tif, ...")->required();
  cmd->add_option("mode", r.mode, "imaging mode: chemi, fluo, vis, uv, protein, universal, ...")
      ->required();
  cmd->add_option("--paras", r.paras,
                  "image parameters {\"ImageParas\": [...]} (file, - or inline JSON); "
                  "default: neutral parameters for every channel file");
  cmd->add_option("--log", r.output.logFile, "write the library's log to FILE");
  cmd->add_flag("-v,--verbose", r.output.verbose, "write the library's log to standard error")
      ->excludes("--log");
  if (withSummary) {
    cmd->add_option("-o,--output", r.output.outFile, "write the answer to FILE");
    cmd->add_flag("--summary", r.output.summary,
                  "print a table (frame, lane, band, position, volumes) instead of JSON");
  }
}

std::string documentOr(const std::string& option, const std::string& value,
                       const std::string& fallback) {
  return value.empty() ? fallback : loadDocument(option, value);
}

// Files of dir/output with their modification times, to tell what an export wrote.
std::map<std::string, fs::file_time_type> outputFiles(const std::string& dir) {
  std::map<std::string, fs::file_time_type> files;
  std::error_code ec;
  for (fs::directory_iterator it(fs::path(dir) / "output", ec), end; !ec && it != end;
       it.increment(ec)) {
    std::error_code timeError;
    const auto t = it->last_write_time(timeError);
    if (!timeError) files[it->path().string()] = t;
  }
  return files;
}

int runStatusCall(const OutputOptions& output, const std::function<int()>& call) {
  StdoutRedirect redirect(output);
  const int status = call();
  redirect.restore();
  return status;
}

}  // namespace

int main(int argc, char** argv) {
  CLI::App app{"viraduve: analyses gel and blot captures through the library's C API.\n"
               "Answers go to standard output, the library's log to --log FILE or, with -v, "
               "to standard error."};
  app.require_subcommand(1);
  std::function<int()> action;

  // The text entry points.
  Request req;
  std::string frame, regions, bgRegion, tpnRequest;

  auto* autoCmd = app.add_subcommand("auto", "find frames, lanes and bands, and measure them");
  addRequestArguments(autoCmd, req, true);
  autoCmd->callback([&] {
    action = [&] {
      const std::string paras = req.imageParas();
      return runTextCall(req.output, [&] {
        return getAutoAnalysisFrameDetection(req.dir.c_str(), req.mode.c_str(), "", paras.c_str());
      });
    };
  });

  using FrameCall = char* (*)(const char*, const char*, const char*, const void*, const char*);
  struct FrameCommand {
    const char* name;
    const char* help;
    FrameCall call;
  };
  const FrameCommand frameCommands[] = {
      {"analyze", "measure the bands of the lanes given in --frame", &getBandLaneAnalysis},
      {"detect", "find lanes and bands inside the frame given in --frame, and measure them",
       &getCustomAnalysisFrame},
      {"update", "find the bands of the lanes marked update_flag again, and measure them",
       &getUpdateBandDetection},
      {"rolling-ball", "measure the bands of --frame against a rolling-ball lane background",
       &getRollingBallOnAnalysedData},
  };
  for (const FrameCommand& fc : frameCommands) {
    auto* cmd = app.add_subcommand(fc.name, fc.help);
    addRequestArguments(cmd, req, true);
    cmd->add_option("--frame", frame, "{\"analysisFrame\": {...}} (file, - or inline JSON)")
        ->required();
    const FrameCall call = fc.call;
    cmd->callback([&, call] {
      action = [&, call] {
        const std::string paras = req.imageParas();
        const std::string frameDoc = loadDocument("--frame", frame);
        return runTextCall(req.output, [&] {
          return call(req.dir.c_str(), frameDoc.c_str(), req.mode.c_str(), nullptr, paras.c_str());
        });
      };
    });
  }

  auto* regionsCmd = app.add_subcommand("regions", "measure rectangular and circular regions");
  addRequestArguments(regionsCmd, req, true);
  regionsCmd->add_option("--regions", regions, "{\"region_list\": [...]} (file, - or inline JSON)")
      ->required();
  regionsCmd->add_option("--bg-region", bgRegion,
                         "{\"bgRegion\": {...}} for the global background (default: none)");
  regionsCmd->callback([&] {
    action = [&] {
      const std::string paras = req.imageParas();
      const std::string regionDoc = loadDocument("--regions", regions);
      const std::string bgDoc = documentOr("--bg-region", bgRegion, "");
      return runTextCall(req.output, [&] {
        return getRegionAnalysis(req.dir.c_str(), regionDoc.c_str(), req.mode.c_str(), nullptr,
                                 paras.c_str(), bgRegion.empty() ? nullptr : bgDoc.c_str());
      });
    };
  });

  auto* tpnCmd = app.add_subcommand("tpn", "total-protein normalisation of the lanes in --tpn");
  addRequestArguments(tpnCmd, req, true);
  tpnCmd->add_option("--frame", frame, "the analysed frame(s) (file, - or inline JSON)")->required();
  tpnCmd->add_option("--tpn", tpnRequest, "{\"frameList\": [...]} (file, - or inline JSON)")
      ->required();
  tpnCmd->callback([&] {
    action = [&] {
      const std::string paras = req.imageParas();
      const std::string frameDoc = loadDocument("--frame", frame);
      const std::string tpnDoc = loadDocument("--tpn", tpnRequest);
      return runTextCall(req.output, [&] {
        return getTPNAnalysisData(req.dir.c_str(), frameDoc.c_str(), req.mode.c_str(),
                                  tpnDoc.c_str(), paras.c_str());
      });
    };
  });

  // Export: writes pictures into FOLDER/output and lists the files it wrote.
  std::string exFrames, exRegions, exAttributes, exOverlay, exAnnotations, exTpn, exMarkers,
      exTexts, exPlatform = "Darwin";
  int exChannelStep = 0;
  auto* exportCmd = app.add_subcommand("export", "render the capture with overlays into FOLDER/output");
  addRequestArguments(exportCmd, req, false);
  exportCmd->add_option("--frames", exFrames,
                        "[{\"analysisFrame\": ...}, ...] or an analysis answer, to draw");
  exportCmd->add_option("--regions", exRegions, "{\"region_list\": [...]} to draw");
  exportCmd->add_option("--attributes", exAttributes,
                        "{\"exportAttribute\": {...}} (default: PNG per channel at pixel size)");
  exportCmd->add_option("--overlay", exOverlay, "{\"overlayList\": [...]} (default: every channel)");
  exportCmd->add_option("--annotations", exAnnotations, "{\"annotationAttribute\": [...]}");
  exportCmd->add_option("--channel-step", exChannelStep, "channel-step flag (default 0)");
  exportCmd->add_option("--tpn-frames", exTpn, "total-protein frames for the lane labels");
  exportCmd->add_option("--markers", exMarkers, "{\"mwMarkerFrame\": [...]}");
  exportCmd->add_option("--texts", exTexts, "[\"text\", ...]");
  exportCmd->add_option("--platform", exPlatform,
                        "platform name handed to the library (which joins paths with / "
                        "whatever it says)")
      ->capture_default_str();
  exportCmd->callback([&] {
    action = [&] {
      const std::string paras = req.imageParas();
      // An analysis answer is taken as it is and turned into the frame list the export reads.
      std::string framesDoc = "[]";
      if (!exFrames.empty()) {
        const std::string text = readDocument("--frames", exFrames);
        framesDoc = isFramesAnswer(text) ? exportFramesFromAnswer(text)
                                         : checkDocument("--frames", exFrames, text);
      }
      const std::string regionsDoc = documentOr("--regions", exRegions, "{\"region_list\": []}");
      const std::string overlayDoc = documentOr("--overlay", exOverlay, allChannelsOverlay(req.dir));
      const std::string annotationsDoc =
          documentOr("--annotations", exAnnotations, "{\"annotationAttribute\": []}");
      const std::string tpnDoc = documentOr("--tpn-frames", exTpn, "[]");
      const std::string markersDoc = documentOr("--markers", exMarkers, "{\"mwMarkerFrame\": []}");
      const std::string textsDoc = documentOr("--texts", exTexts, "[]");
      const std::string attributesDoc =
          exAttributes.empty()
              ? defaultExportAttributes(req.dir, !exFrames.empty() || !exRegions.empty(),
                                        !exAnnotations.empty(), !exMarkers.empty())
              : loadDocument("--attributes", exAttributes);
      const auto before = outputFiles(req.dir);
      const int status = runStatusCall(req.output, [&] {
        return convertAndExportImage(req.dir.c_str(), framesDoc.c_str(), regionsDoc.c_str(),
                                     req.mode.c_str(), nullptr, attributesDoc.c_str(),
                                     paras.c_str(), overlayDoc.c_str(), annotationsDoc.c_str(),
                                     exChannelStep, tpnDoc.c_str(), markersDoc.c_str(),
                                     textsDoc.c_str(), exPlatform.c_str());
      });
      if (status != 0) {
        reportError("export failed (status " + std::to_string(status) + ", see the log)");
        return kExitError;
      }
      int written = 0;
      for (const auto& [path, time] : outputFiles(req.dir)) {
        const auto old = before.find(path);
        if (old == before.end() || old->second != time) {
          std::cout << path << '\n';
          ++written;
        }
      }
      std::cout.flush();
      // A request that exported nothing is not a success, whatever the status said.
      if (written == 0) {
        reportError("export wrote no file (see the log)");
        return kExitError;
      }
      return kExitAnswer;
    };
  });

  // Conversion of one image file.
  std::string source, target;
  OutputOptions convertOutput;
  auto* convertCmd = app.add_subcommand("convert", "convert an image file to TIFF (or the target's format)");
  convertCmd->add_option("source", source, "image file to read")->required();
  convertCmd->add_option("target", target, "file to write; its extension selects the format")
      ->required();
  convertCmd->add_option("--log", convertOutput.logFile, "write the library's log to FILE");
  convertCmd->add_flag("-v,--verbose", convertOutput.verbose, "write the library's log to standard error")
      ->excludes("--log");
  convertCmd->callback([&] {
    action = [&] {
      requireReadableFile(source);
      const int status =
          runStatusCall(convertOutput, [&] { return vitToTiff(source.c_str(), target.c_str()); });
      if (status != 1) {
        reportError("conversion of " + source + " failed (see the log)");
        return kExitError;
      }
      std::error_code ec;
      if (!fs::exists(target, ec)) {
        reportError("conversion wrote no file " + target);
        return kExitError;
      }
      return kExitAnswer;
    };
  });

  // Synthetic capture with its truth.
  int width = 512, height = 512, lanes = 6, bands = 4, channels = 1, dust = 0;
  unsigned seed = 1;
  double noise = 0.0, tilt = 0.0, smile = 0.0;
  bool darkOnBright = false, saturate = false;
  std::string truthFile;
  auto* synthCmd = app.add_subcommand(
      "synth", "write a synthetic gel (ch0.tif, ...) into FOLDER and print its true frame JSON");
  synthCmd->add_option("folder", req.dir, "folder to write (created when missing)")->required();
  synthCmd->add_option("--width", width, "image width")->capture_default_str()->check(CLI::PositiveNumber);
  synthCmd->add_option("--height", height, "image height")->capture_default_str()->check(CLI::PositiveNumber);
  synthCmd->add_option("--lanes", lanes, "lanes")->capture_default_str()->check(CLI::PositiveNumber);
  synthCmd->add_option("--bands", bands, "bands per lane")->capture_default_str()->check(CLI::NonNegativeNumber);
  synthCmd->add_option("--channels", channels, "channel files")->capture_default_str()->check(CLI::PositiveNumber);
  synthCmd->add_option("--seed", seed, "random seed")->capture_default_str();
  synthCmd->add_option("--noise", noise, "Gaussian noise sigma")->capture_default_str();
  synthCmd->add_option("--tilt", tilt, "lane tilt in degrees")->capture_default_str();
  synthCmd->add_option("--smile", smile, "band smile")->capture_default_str();
  synthCmd->add_option("--dust", dust, "dust specks")->capture_default_str();
  synthCmd->add_flag("--dark-on-bright", darkOnBright, "render dark bands on a bright background");
  synthCmd->add_flag("--saturate", saturate, "clip intensities at 65535");
  synthCmd->add_option("-o,--output", truthFile, "write the frame JSON to FILE");
  synthCmd->callback([&] {
    action = [&] {
      viraduve::synth::CaptureSpec plan =
          viraduve::synth::cleanGel(width, height, lanes, bands, seed);
      plan.channels = channels;
      plan.noiseSigma = noise;
      plan.tiltDegrees = tilt;
      plan.smile = smile;
      plan.dust = dust;
      plan.darkOnBright = darkOnBright;
      plan.saturate = saturate;
      std::ofstream out;
      if (!truthFile.empty()) {
        out.open(truthFile, std::ios::binary | std::ios::trunc);
        if (!out) throw UsageError("cannot write output file " + truthFile);
      }
      const viraduve::synth::Truth truth = viraduve::synth::writeCapture(plan, req.dir);
      (truthFile.empty() ? std::cout : out) << viraduve::synth::truthFrameJson(truth, 0);
      return kExitAnswer;
    };
  });

  // A first look: capture, automatic analysis, table, answer file and exported picture.
  DemoOptions demo;
  auto* demoCmd = app.add_subcommand(
      "demo", "analyse a synthetic two-channel blot (or, with --real, a real DNA gel) and "
              "export a picture of the result");
  demoCmd->add_option("--out", demo.out,
                      "working folder (created when missing); default: a new temporary folder");
  demoCmd->add_flag("--real", demo.real, "use the real DNA gel (mode uv) instead");
  demoCmd->add_option("--gel", demo.gel, "folder of the real gel's ch0.tif (with --real)");
  demoCmd->add_flag("-v,--verbose", demo.verbose, "write the library's log to standard error");
  demoCmd->callback([&] { action = [&] { return runDemo(demo); }; });

  try {
    app.parse(argc, argv);
  } catch (const CLI::CallForHelp& e) {
    return app.exit(e);
  } catch (const CLI::CallForAllHelp& e) {
    return app.exit(e);
  } catch (const CLI::ParseError& e) {
    reportError(std::string(e.what()) + " (see --help)");
    return kExitRefused;
  }
  try {
    return action();
  } catch (const UsageError& e) {
    reportError(e.what());
    return kExitRefused;
  } catch (const std::exception& e) {
    reportError(e.what());
    return kExitError;
  }
}
