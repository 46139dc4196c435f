// Region analysis, rolling-ball measures and total-protein normalisation on a 2048 x 2048
// capture, against the work no implementation can skip: decoding the channel file and the
// whole-image steps each analysis is built on.
#include <stdlib.h>

#include <algorithm>
#include <cstdio>
#include <filesystem>
#include <sstream>
#include <string>
#include <vector>

#include <json/json.h>
#include <opencv2/imgcodecs.hpp>
#include <opencv2/imgproc.hpp>

#include "bench.h"
#include "synth.h"
#include "viraduve/viraduve.h"

namespace {

struct Capture {
  std::string dir;
  std::string frame;
  std::string paras;
  std::string regions;
  std::string tpn;
  Capture() {
    char name[] = "/tmp/viraduve-bench-XXXXXX";
    dir = mkdtemp(name);
    const viraduve::synth::Truth truth =
        viraduve::synth::writeCapture(viraduve::synth::cleanGel(2048, 2048, 12, 6, 23), dir);
    frame = viraduve::synth::truthFrameJson(truth, 0);
    paras = viraduve::synth::imageParasJson(1);

    std::ostringstream r;
    r << "{\"region_list\": [";
    for (int i = 0; i < 100; ++i) {
      const int x = 100 + (i % 10) * 180;
      const int y = 100 + (i / 10) * 180;
      r << (i ? "," : "") << "{\"channel\": 0, ";
      if (i % 2 == 0) {
        r << "\"circle_b\": true, \"x\": " << x << ", \"y\": " << y
          << ", \"circle_radius\": " << 20 + i % 40;
      } else {
        r << "\"circle_b\": false, \"x1\": " << x << ", \"y1\": " << y << ", \"x2\": " << x + 60
          << ", \"y2\": " << y + 40;
      }
      r << "}";
    }
    r << "]}";
    regions = r.str();

    Json::Value f;
    std::istringstream(frame) >> f;
    const Json::Value& af = f["analysisFrame"];
    Json::Value request;
    Json::Value& entry = request["frameList"][0];
    for (const char* k : {"x1", "x2", "y1", "y2"}) entry["analysisFrameRoi"][k] = af[k];
    entry["channel"] = 0;
    for (Json::ArrayIndex j = 0; j < af["roiList"].size(); ++j) {
      Json::Value& named = entry["normalizeLanes"][j];
      named["laneVolTop"]["y1"] = af["y1"];
      named["laneVolBottom"]["y2"] = af["y2"];
      for (const char* k : {"x1", "x2", "y1", "y2"}) named["laneRoi"][k] = af["roiList"][j]["lane"][k];
    }
    tpn = Json::writeString(Json::StreamWriterBuilder(), request);
  }
  ~Capture() {
    std::error_code ec;
    std::filesystem::remove_all(dir, ec);
  }
};

cv::Mat decode(const std::string& dir) { return cv::imread(dir + "/ch0.tif", cv::IMREAD_UNCHANGED); }

void answer(char* text) {
  if (text == nullptr || std::string(text) == "error") std::fprintf(stderr, "call failed\n");
  releaseResult(text);
}

void reportAgainst(const char* name, double seconds, double base) {
  char note[64];
  std::snprintf(note, sizeof note, "%.2f x the unavoidable work", seconds / base);
  bench::report(name, seconds, note);
}

}  // namespace

VIRADUVE_BENCH(normRegionsRollingBallTpn) {
  const Capture capture;
  const double decodeOnly = bench::medianSeconds(3, [&] { decode(capture.dir); });
  bench::report("norm: decode 2048^2 TIFF", decodeOnly);
  const double tophat = bench::medianSeconds(3, [&] {
    cv::Mat f;
    cv::Mat t;
    decode(capture.dir).convertTo(f, CV_32F, 1.0 / 65536.0);
    cv::morphologyEx(f, t, cv::MORPH_TOPHAT,
                     cv::getStructuringElement(cv::MORPH_RECT, cv::Size(61, 61)));
  });
  bench::report("norm: decode + 61x61 top-hat", tophat);

  const double regions = bench::medianSeconds(3, [&] {
    answer(getRegionAnalysis(capture.dir.c_str(), capture.regions.c_str(), "protein", nullptr,
                             capture.paras.c_str(), nullptr));
  });
  reportAgainst("norm: getRegionAnalysis, 50 circles + 50 rectangles", regions, tophat);

  // The rolling-ball call must make the 8-bit, float and subtracted images of the capture and
  // the near-median of the frame.
  const double rollingBase = bench::medianSeconds(3, [&] {
    const cv::Mat raw = decode(capture.dir);
    cv::Mat e, a, r;
    raw.convertTo(e, CV_8U, 1.0 / 256);
    raw.convertTo(a, CV_32F);
    e.convertTo(r, CV_32F, 256.0);
    std::vector<float> v(a.begin<float>(), a.end<float>());
    std::nth_element(v.begin(), v.begin() + v.size() / 2, v.end());
  });
  bench::report("norm: decode + 8-bit, float images + near-median", rollingBase);
  const double rolling = bench::medianSeconds(3, [&] {
    answer(getRollingBallOnAnalysedData(capture.dir.c_str(), capture.frame.c_str(), "protein",
                                        nullptr, capture.paras.c_str()));
  });
  reportAgainst("norm: getRollingBallOnAnalysedData, 12 lanes x 6 bands", rolling, rollingBase);

  const double tpn = bench::medianSeconds(3, [&] {
    answer(getTPNAnalysisData(capture.dir.c_str(), capture.frame.c_str(), "protein",
                              capture.tpn.c_str(), capture.paras.c_str()));
  });
  reportAgainst("norm: getTPNAnalysisData, 12 lanes", tpn, tophat);
}
