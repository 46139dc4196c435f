// Band analysis of given lanes and detection inside a given frame on a large two-channel
// capture, against the work no implementation can skip: decoding the channel files and one
// 61 x 61 top-hat per channel.
#include <stdlib.h>

#include <cstdio>
#include <filesystem>
#include <string>

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
  Capture() {
    char name[] = "/tmp/viraduve-bench-XXXXXX";
    dir = mkdtemp(name);
    // Ten bands per lane need narrower bands than the clean gel scales to this height.
    viraduve::synth::CaptureSpec plan = viraduve::synth::cleanGel(2048, 2048, 10, 1, 17);
    plan.channels = 2;
    for (viraduve::synth::FrameSpec& frame : plan.frames) {
      const double step = frame.rect.height * 0.8 / 10;
      for (viraduve::synth::LaneSpec& lane : frame.lanes) {
        const viraduve::synth::BandSpec model = lane.bands.at(0);
        lane.bands.clear();
        for (int b = 0; b < 10; ++b) {
          viraduve::synth::BandSpec band = model;
          band.row = frame.rect.height * 0.1 + step * (b + 0.5);
          band.sigma = 6.0;
          band.volume = model.volume * 6.0 / model.sigma;
          lane.bands.push_back(band);
        }
      }
    }
    const viraduve::synth::Truth truth = viraduve::synth::writeCapture(plan, dir);
    frame = viraduve::synth::truthFrameJson(truth, 0);
    paras = viraduve::synth::imageParasJson(2);
  }
  ~Capture() {
    std::error_code ec;
    std::filesystem::remove_all(dir, ec);
  }
};

void unavoidable(const std::string& dir) {
  const cv::Mat element = cv::getStructuringElement(cv::MORPH_RECT, cv::Size(61, 61));
  for (const char* file : {"/ch0.tif", "/ch1.tif"}) {
    const cv::Mat raw = cv::imread(dir + file, cv::IMREAD_UNCHANGED);
    cv::Mat f;
    cv::Mat t;
    raw.convertTo(f, CV_32F, 1.0 / 65536.0);
    cv::morphologyEx(f, t, cv::MORPH_TOPHAT, element);
  }
}

void answer(char* text) {
  if (text == nullptr || std::string(text) == "error") std::fprintf(stderr, "analysis failed\n");
  releaseResult(text);
}

}  // namespace

VIRADUVE_BENCH(analysisOfGivenAndFoundLanes) {
  const Capture capture;
  const double base = bench::medianSeconds(3, [&] { unavoidable(capture.dir); });
  bench::report("analysis: decode 2 x 2048^2 TIFF + 61x61 top-hat each", base);

  const double given = bench::medianSeconds(3, [&] {
    answer(getBandLaneAnalysis(capture.dir.c_str(), capture.frame.c_str(), "chemi", nullptr,
                               capture.paras.c_str()));
  });
  char note[64];
  std::snprintf(note, sizeof note, "%.2f x the unavoidable work", given / base);
  bench::report("analysis: getBandLaneAnalysis, 2 ch, 10 lanes x 10 bands", given, note);

  const double custom = bench::medianSeconds(3, [&] {
    answer(getCustomAnalysisFrame(capture.dir.c_str(), capture.frame.c_str(), "chemi", nullptr,
                                  capture.paras.c_str()));
  });
  std::snprintf(note, sizeof note, "%.2f x the unavoidable work", custom / base);
  bench::report("analysis: getCustomAnalysisFrame, 2 ch, 2048^2", custom, note);
}
