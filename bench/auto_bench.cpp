// Automatic analysis of a two-channel 2048 x 2048 capture with two membranes: the whole
// exported call, and its three drivers timed one by one (frame detection, lane and band
// detection, quantification); the rest of the call is parsing, straightening the channel
// files and encoding the answer.
#include <stdlib.h>

#include <cstdio>
#include <filesystem>
#include <string>
#include <vector>

#include "bench.h"
#include "pipeline/ImageProcessing.h"
#include "synth.h"
#include "viraduve/viraduve.h"

namespace {

struct TwoMembraneCapture {
  std::string dir;
  std::string paras;
  TwoMembraneCapture() {
    char name[] = "/tmp/viraduve-bench-auto-XXXXXX";
    dir = mkdtemp(name);
    viraduve::synth::CaptureSpec plan;
    plan.width = 2048;
    plan.height = 2048;
    plan.channels = 2;
    plan.background = 2000.0;
    plan.noiseSigma = 400.0;
    plan.seed = 5;
    for (int f = 0; f < 2; ++f) {
      viraduve::synth::FrameSpec frame;
      frame.rect = cv::Rect(120 + f * 1000, 200, 850, 1650);
      frame.level = 25000.0;
      for (int l = 0; l < 8; ++l) {
        viraduve::synth::LaneSpec lane;
        lane.centre = 850.0 * (l + 0.5) / 8;
        lane.width = 61;
        for (int b = 0; b < 6; ++b) lane.bands.push_back({250.0 + 230.0 * b, 8.0, 2.0e7});
        frame.lanes.push_back(lane);
      }
      plan.frames.push_back(frame);
    }
    viraduve::synth::writeCapture(plan, dir);
    paras = viraduve::synth::imageParasJson(2);
  }
  ~TwoMembraneCapture() {
    std::error_code ec;
    std::filesystem::remove_all(dir, ec);
  }
};

}  // namespace

VIRADUVE_BENCH(autoAnalysis2048TwoChannels) {
  using namespace viraduve;
  const TwoMembraneCapture capture;
  const ImageMode mode = ImageMode_Chemi;
  const std::vector<ImageParam> params(2);

  std::vector<ROI> rois;
  const double frames = bench::medianSeconds(3, [&] {
    rois.clear();
    ImageProcessing::runAnalysisFrameDetection(capture.dir, rois, params, mode);
  });
  ImageProcessing::LanesPerFrame lanes;
  const double detection = bench::medianSeconds(3, [&] {
    lanes.clear();
    ImageProcessing::runBandLandeDetection(capture.dir, lanes, rois, params, mode);
  });
  const ImageProcessing::LanesPerFrame detected = lanes;
  const double quantification = bench::medianSeconds(3, [&] {
    lanes = detected;
    ImageProcessing::runBandLandeAnalysis(capture.dir, lanes, params, mode);
  });
  const double whole = bench::medianSeconds(3, [&] {
    releaseResult(getAutoAnalysisFrameDetection(capture.dir.c_str(), "chemi", "",
                                                capture.paras.c_str()));
  });

  std::size_t laneCount = 0;
  for (const auto& frameLanes : detected) laneCount += frameLanes.size();
  char note[160];
  std::snprintf(note, sizeof note, "%zu frames, %zu lanes (2 x 8 drawn)", rois.size(), laneCount);
  bench::report("auto analysis: whole call", whole, note);
  bench::report("auto analysis: runAnalysisFrameDetection", frames);
  bench::report("auto analysis: runBandLandeDetection", detection);
  bench::report("auto analysis: runBandLandeAnalysis", quantification);
  bench::report("auto analysis: rest (parse, straighten files, encode)",
                whole - frames - detection - quantification);
}
