// Full detection and band update on a large synthetic gel: 2048 x 2048, 12 lanes x 10 bands.
#include <cstdio>
#include <string>
#include <vector>

#include "bench.h"
#include "detector/BandLaneDetectionImpl.h"
#include "synth.h"

namespace {

struct LargeGel {
  viraduve::Image image;
  viraduve::ROI frame;
  std::vector<viraduve::Lane2D> lanes;  // the true lanes, marked for update
};

LargeGel largeGel() {
  using namespace viraduve;
  synth::CaptureSpec plan = synth::cleanGel(2048, 2048, 12, 1, 42);
  synth::FrameSpec& frame = plan.frames[0];
  // Ten bands of sigma 8 px, 150 px apart, in the middle 80 % of the frame.
  for (synth::LaneSpec& lane : frame.lanes) {
    const double volume = lane.bands[0].volume / lane.bands[0].sigma * 8.0;
    lane.bands.clear();
    for (int b = 0; b < 10; ++b)
      lane.bands.push_back(synth::BandSpec{frame.rect.height * 0.1 + 75.0 + 150.0 * b, 8.0, volume});
  }
  std::vector<cv::Mat> channels;
  const synth::Truth truth = synth::render(plan, channels);
  LargeGel gel;
  gel.image.setMat(channels[0]);
  const synth::TruthFrame& f = truth.frames[0];
  gel.frame = ROI{f.x1, f.y1, f.x2, f.y2};
  for (const synth::TruthLane& t : f.lanes) {
    Lane2D lane;
    lane.x1 = static_cast<int>(t.centreTop);
    lane.x2 = static_cast<int>(t.centreBottom);
    lane.y1 = f.y1;
    lane.y2 = f.y2;
    lane.width = t.width;
    lane.update_flag = true;
    gel.lanes.push_back(lane);
  }
  return gel;
}

// The library logs to standard output; the table goes to standard error.
void quietStdout() { std::freopen("/dev/null", "w", stdout); }

}  // namespace

VIRADUVE_BENCH(detectorDetect2048) {
  quietStdout();
  const LargeGel gel = largeGel();
  std::size_t lanes = 0, bands = 0;
  const double s = bench::medianSeconds(5, [&] {
    viraduve::BandLaneDetectionImpl detector;
    std::vector<viraduve::Lane2D> found;
    detector.detect(gel.image, gel.frame, found);
    lanes = found.size();
    bands = 0;
    for (const auto& l : found) bands += l.bands.size();
  });
  bench::report("detect 2048x2048, 12 lanes x 10 bands", s,
                std::to_string(lanes) + " lanes, " + std::to_string(bands) + " bands");
}

VIRADUVE_BENCH(detectorDetectNew2048) {
  quietStdout();
  const LargeGel gel = largeGel();
  std::size_t bands = 0;
  const double s = bench::medianSeconds(5, [&] {
    viraduve::BandLaneDetectionImpl detector;
    std::vector<viraduve::Lane2D> out;
    detector.detect_new(gel.image, gel.frame, gel.lanes, 0, out);
    bands = 0;
    for (const auto& l : out) bands += l.bands.size();
  });
  bench::report("detect_new 2048x2048, 12 lanes x 10 bands", s, std::to_string(bands) + " bands");
}
