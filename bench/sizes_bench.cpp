// Every exported entry point on synthetic captures of 1, 4 and 16 megapixels with one and
// two channels: median wall time and peak resident memory per case.
//
// Each case runs in its own forked child, so its peak memory (ru_maxrss of the child) is
// that case's alone; the captures are written by children too, so the parent never holds an
// image (nor starts OpenCV's worker threads, which a fork would not carry over).
// VIRADUVE_BENCH_MAX_MP=4 leaves out the larger captures.
#include <stdlib.h>
#include <sys/resource.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <chrono>
#include <cmath>
#include <cstdio>
#include <cstring>
#include <filesystem>
#include <functional>
#include <map>
#include <stdexcept>
#include <string>
#include <vector>

#include <json/json.h>
#include <opencv2/imgcodecs.hpp>

#include "bench.h"
#include "synth.h"
#include "viraduve/viraduve.h"

namespace {

namespace fs = std::filesystem;

struct Size {
  int megapixels;
  int side;
  int runs;  // timed calls, the first one included: a host's call comes cold too
};

// Repetitions shrink with the size so that the whole table takes a few minutes.
const Size kSizes[] = {{1, 1024, 5}, {4, 2048, 3}, {16, 4096, 1}};
const int kLanes = 12;
const int kBandsPerLane = 8;

// The documents of every request on one capture.
struct Requests {
  std::string dir;
  std::string mode;
  std::string paras;
  std::string frame;        // {"analysisFrame": ...} with the true lanes and bands
  std::string updateFrame;  // the same with every lane marked for update
  std::string frameList;    // [{"analysisFrame": ...}]
  std::string regions;
  std::string tpn;
  std::string exportAttributes;
  std::string overlayList;
};

std::string compact(const Json::Value& value) {
  Json::StreamWriterBuilder builder;
  builder["indentation"] = "";
  return Json::writeString(builder, value);
}

Json::Value parse(const std::string& text) {
  Json::Value root;
  Json::Reader().parse(text, root);
  return root;
}

// 20 rectangles and 20 circles spread over the frame, sized with the capture.
std::string regionsFor(const viraduve::synth::TruthFrame& f, int side) {
  Json::Value list(Json::arrayValue);
  const int w = f.x2 - f.x1, h = f.y2 - f.y1, r = side / 64;
  for (int i = 0; i < 40; ++i) {
    const int x = f.x1 + w * (i % 8 + 1) / 9, y = f.y1 + h * (i / 8 + 1) / 6;
    Json::Value region(Json::objectValue);
    region["uid"] = "r" + std::to_string(i);
    region["channel"] = 0;
    region["bg_corrected"] = true;
    region["circle_b"] = i % 2 == 1;
    if (i % 2) {
      region["x"] = x;
      region["y"] = y;
      region["circle_radius"] = r;
    } else {
      region["x1"] = x - r;
      region["y1"] = y - r;
      region["x2"] = x + r;
      region["y2"] = y + r;
    }
    list.append(region);
  }
  Json::Value root(Json::objectValue);
  root["region_list"] = list;
  return compact(root);
}

// Every lane normalised on the last channel, over the frame's full height.
std::string tpnFor(const Json::Value& frame, int channel) {
  Json::Value entry(Json::objectValue);
  for (const char* k : {"x1", "y1", "x2", "y2"}) entry["analysisFrameRoi"][k] = frame[k];
  entry["uid"] = frame["uid"];
  entry["channel"] = channel;
  entry["normalizeLanes"] = Json::Value(Json::arrayValue);
  for (const Json::Value& roi : frame["roiList"]) {
    const Json::Value& lane = roi["lane"];
    Json::Value n(Json::objectValue);
    n["laneVolTop"]["y1"] = frame["y1"];
    n["laneVolBottom"]["y2"] = frame["y2"];
    n["uid"] = lane["uid"];
    for (const char* k : {"x1", "y1", "x2", "y2"}) n["laneRoi"][k] = lane[k];
    entry["normalizeLanes"].append(n);
  }
  Json::Value root(Json::objectValue);
  root["frameList"].append(entry);
  return compact(root);
}

// A clean gel; with two channels, channel 0 is the white-light picture of a chemiluminescence
// capture (dark on bright, as mode "chemi" expects) and channel 1 the signal.
Requests writeCapture(const std::string& dir, int side, int channels) {
  viraduve::synth::CaptureSpec plan =
      viraduve::synth::cleanGel(side, side, kLanes, kBandsPerLane, 3);
  plan.channels = channels;
  plan.noiseSigma = 200.0;
  const viraduve::synth::Truth truth = viraduve::synth::writeCapture(plan, dir);
  if (channels == 2) {
    viraduve::synth::CaptureSpec whiteLight = plan;
    whiteLight.channels = 1;
    whiteLight.darkOnBright = true;
    std::vector<cv::Mat> pictures;
    viraduve::synth::render(whiteLight, pictures);
    cv::imwrite(dir + "/ch0.tif", pictures.at(0));
  }

  Requests r;
  r.dir = dir;
  r.mode = channels == 2 ? "chemi" : "uv";
  Json::Value paras = parse(viraduve::synth::imageParasJson(channels));
  for (Json::Value& p : paras["ImageParas"]) p["channelAppMode"] = r.mode;
  r.paras = compact(paras);
  Json::Value frame = parse(viraduve::synth::truthFrameJson(truth, 0));
  r.frame = compact(frame);
  Json::Value list(Json::arrayValue);
  list.append(frame);
  r.frameList = compact(list);
  for (Json::Value& roi : frame["analysisFrame"]["roiList"]) roi["lane"]["update_flag"] = true;
  r.updateFrame = compact(frame);
  r.regions = regionsFor(truth.frames.at(0), side);
  r.tpn = tpnFor(frame["analysisFrame"], channels - 1);
  char attributes[256];
  std::snprintf(attributes, sizeof attributes,
                "{\"exportAttribute\": {\"exportLayers\": true, \"format\": 1, "
                "\"channelSelection\": 2, \"dpi\": 254, \"height\": %.4f, \"width\": %.4f}}",
                (side + 0.5) / 100.0, (side + 0.5) / 100.0);
  r.exportAttributes = attributes;
  r.overlayList = channels == 2 ? "{\"overlayList\": [0, 1]}" : "{\"overlayList\": [0]}";
  return r;
}

// The documents travel from the child that wrote the capture to the children that time
// the calls in a file beside the channel files.
void saveRequests(const Requests& r) {
  Json::Value root(Json::objectValue);
  root["mode"] = r.mode;
  root["paras"] = r.paras;
  root["frame"] = r.frame;
  root["updateFrame"] = r.updateFrame;
  root["frameList"] = r.frameList;
  root["regions"] = r.regions;
  root["tpn"] = r.tpn;
  root["exportAttributes"] = r.exportAttributes;
  root["overlayList"] = r.overlayList;
  std::FILE* file = std::fopen((r.dir + "/requests.json").c_str(), "wb");
  if (!file) throw std::runtime_error("cannot write the requests");
  const std::string text = compact(root);
  std::fwrite(text.data(), 1, text.size(), file);
  std::fclose(file);
}

Requests loadRequests(const std::string& dir) {
  std::FILE* file = std::fopen((dir + "/requests.json").c_str(), "rb");
  if (!file) throw std::runtime_error("no requests");
  std::string text;
  char buffer[65536];
  for (std::size_t n; (n = std::fread(buffer, 1, sizeof buffer, file)) > 0;) text.append(buffer, n);
  std::fclose(file);
  const Json::Value root = parse(text);
  Requests r;
  r.dir = dir;
  r.mode = root["mode"].asString();
  r.paras = root["paras"].asString();
  r.frame = root["frame"].asString();
  r.updateFrame = root["updateFrame"].asString();
  r.frameList = root["frameList"].asString();
  r.regions = root["regions"].asString();
  r.tpn = root["tpn"].asString();
  r.exportAttributes = root["exportAttributes"].asString();
  r.overlayList = root["overlayList"].asString();
  return r;
}

// One call of an entry point; false when it answered null, "error" or a failure status.
using Call = std::function<bool(const Requests&)>;

bool textAnswer(char* answer) {
  const bool ok = answer && std::strcmp(answer, "error") != 0;
  releaseResult(answer);
  return ok;
}

const std::vector<std::pair<std::string, Call>>& entryPoints() {
  static const std::vector<std::pair<std::string, Call>> calls = {
      {"getAutoAnalysisFrameDetection",
       [](const Requests& r) {
         return textAnswer(getAutoAnalysisFrameDetection(r.dir.c_str(), r.mode.c_str(), "",
                                                         r.paras.c_str()));
       }},
      {"getBandLaneAnalysis",
       [](const Requests& r) {
         return textAnswer(getBandLaneAnalysis(r.dir.c_str(), r.frame.c_str(), r.mode.c_str(),
                                               nullptr, r.paras.c_str()));
       }},
      {"getCustomAnalysisFrame",
       [](const Requests& r) {
         return textAnswer(getCustomAnalysisFrame(r.dir.c_str(), r.frame.c_str(),
                                                  r.mode.c_str(), nullptr, r.paras.c_str()));
       }},
      {"getUpdateBandDetection",
       [](const Requests& r) {
         return textAnswer(getUpdateBandDetection(r.dir.c_str(), r.updateFrame.c_str(),
                                                  r.mode.c_str(), nullptr, r.paras.c_str()));
       }},
      {"getRollingBallOnAnalysedData",
       [](const Requests& r) {
         return textAnswer(getRollingBallOnAnalysedData(r.dir.c_str(), r.frame.c_str(),
                                                        r.mode.c_str(), nullptr,
                                                        r.paras.c_str()));
       }},
      {"getRegionAnalysis",
       [](const Requests& r) {
         return textAnswer(getRegionAnalysis(r.dir.c_str(), r.regions.c_str(), r.mode.c_str(),
                                             nullptr, r.paras.c_str(), nullptr));
       }},
      {"getTPNAnalysisData",
       [](const Requests& r) {
         return textAnswer(getTPNAnalysisData(r.dir.c_str(), r.frameList.c_str(),
                                              r.mode.c_str(), r.tpn.c_str(), r.paras.c_str()));
       }},
      {"convertAndExportImage",
       [](const Requests& r) {
         return convertAndExportImage(r.dir.c_str(), r.frameList.c_str(), r.regions.c_str(),
                                      r.mode.c_str(), nullptr, r.exportAttributes.c_str(),
                                      r.paras.c_str(), r.overlayList.c_str(),
                                      "{\"annotationAttribute\": []}", 0, "[]",
                                      "{\"mwMarkerFrame\": []}", "[]", "Darwin") == 0;
       }},
      {"vitToTiff",
       [](const Requests& r) {
         return vitToTiff((r.dir + "/ch0.tif").c_str(), (r.dir + "/converted.tif").c_str()) == 1;
       }},
  };
  return calls;
}

struct Outcome {
  double seconds = 0.0;
  int failures = 0;    // calls that did not answer
  bool ran = false;    // the child finished normally
  double peakMiB = 0.0;
  double cpuSeconds = 0.0;  // user + system time of the whole child
};

// Runs job in a forked child that writes one Outcome to a pipe; adds the child's peak RSS
// and processor time, which a busy machine inflates far less than the wall time.
Outcome inChild(const std::function<Outcome()>& job) {
  Outcome outcome;
  int fds[2];
  if (pipe(fds) != 0) return outcome;
  std::fflush(nullptr);
  const pid_t pid = fork();
  if (pid == 0) {
    close(fds[0]);
    Outcome result;
    try {
      result = job();
      result.ran = true;
    } catch (...) {
      result.ran = false;
    }
    const ssize_t written = write(fds[1], &result, sizeof result);
    std::fflush(nullptr);
    _exit(written == static_cast<ssize_t>(sizeof result) ? 0 : 1);
  }
  close(fds[1]);
  if (pid < 0) {
    close(fds[0]);
    return outcome;
  }
  Outcome received;
  const bool got = read(fds[0], &received, sizeof received) == static_cast<ssize_t>(sizeof received);
  close(fds[0]);
  int status = 0;
  rusage usage{};
  wait4(pid, &status, 0, &usage);
  if (got && WIFEXITED(status) && WEXITSTATUS(status) == 0) outcome = received;
  outcome.peakMiB = static_cast<double>(usage.ru_maxrss) / 1024.0;
  outcome.cpuSeconds = static_cast<double>(usage.ru_utime.tv_sec + usage.ru_stime.tv_sec) +
                       static_cast<double>(usage.ru_utime.tv_usec + usage.ru_stime.tv_usec) / 1e6;
  return outcome;
}

int maxMegapixels() {
  const char* limit = std::getenv("VIRADUVE_BENCH_MAX_MP");
  return limit ? std::atoi(limit) : 16;
}

}  // namespace

VIRADUVE_BENCH(entryPointsBySize) {
  // What a child costs before it does anything: the parent's pages and the libraries.
  const Outcome idle = inChild([] { return Outcome(); });
  bench::report("sizes: idle child", 0.0,
                "peak RSS " + std::to_string(static_cast<int>(std::lround(idle.peakMiB))) + " MiB");

  // results[entry point][column] = outcome; columns are "1 MP 1 ch", "1 MP 2 ch", ...
  std::vector<std::string> columns;
  std::vector<int> columnRuns;
  std::map<std::string, std::vector<Outcome>> results;
  for (const Size& size : kSizes) {
    if (size.megapixels > maxMegapixels()) continue;
    for (int channels = 1; channels <= 2; ++channels) {
      char name[] = "/tmp/viraduve-bench-sizes-XXXXXX";
      if (!mkdtemp(name)) return;
      const std::string dir = name;
      const std::string column =
          std::to_string(size.megapixels) + " MP " + std::to_string(channels) + " ch";
      columns.push_back(column);
      columnRuns.push_back(size.runs);
      const Outcome written = inChild([&] {
        saveRequests(writeCapture(dir, size.side, channels));
        return Outcome();
      });
      if (!written.ran) {
        bench::report("sizes: cannot write the capture " + column, 0.0);
        return;
      }
      for (const auto& [entry, call] : entryPoints()) {
        const Outcome outcome = inChild([&, call = call] {
          const Requests requests = loadRequests(dir);
          Outcome o;
          std::vector<double> times;
          for (int i = 0; i < size.runs; ++i) {
            const auto start = std::chrono::steady_clock::now();
            if (!call(requests)) ++o.failures;
            times.push_back(std::chrono::duration<double>(std::chrono::steady_clock::now() - start)
                                .count());
          }
          std::sort(times.begin(), times.end());
          o.seconds = times[times.size() / 2];
          return o;
        });
        results[entry].push_back(outcome);
        char note[160];
        std::snprintf(note, sizeof note, "cpu %7.3f s/call, peak RSS %5.0f MiB, %d run%s%s",
                      outcome.cpuSeconds / size.runs, outcome.peakMiB, size.runs,
                      size.runs == 1 ? "" : "s",
                      !outcome.ran ? ", DID NOT FINISH" : outcome.failures ? ", FAILED" : "");
        bench::report("sizes: " + entry + " " + column, outcome.seconds, note);
      }
      std::error_code ec;
      fs::remove_all(dir, ec);
    }
  }

  // The matrix: wall seconds (median) / processor seconds per call / peak MiB.
  std::fprintf(stderr, "\n%-30s", "wall s / cpu s / peak MiB");
  for (const std::string& c : columns) std::fprintf(stderr, " %24s", c.c_str());
  std::fprintf(stderr, "\n");
  for (const auto& [entry, call] : entryPoints()) {
    (void)call;
    std::fprintf(stderr, "%-30s", entry.c_str());
    for (std::size_t i = 0; i < results[entry].size(); ++i) {
      const Outcome& o = results[entry][i];
      char cell[48];
      if (!o.ran || o.failures)
        std::snprintf(cell, sizeof cell, "failed");
      else
        std::snprintf(cell, sizeof cell, "%.3f / %.3f / %.0f", o.seconds,
                      o.cpuSeconds / columnRuns[i], o.peakMiB);
      std::fprintf(stderr, " %24s", cell);
    }
    std::fprintf(stderr, "\n");
  }
}
