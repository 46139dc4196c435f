// Synthetic gel and blot captures with ground truth, deterministic by seed.
// Used by the tests, the demo and the benchmarks.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include <opencv2/core.hpp>

namespace viraduve {
namespace synth {

struct BandSpec {
  double row = 0.0;        // centre row, relative to the frame's top edge (pixels)
  double sigma = 4.0;      // vertical Gaussian sigma (pixels)
  double volume = 1.0e6;   // integrated intensity above the background (16-bit units)
};

struct LaneSpec {
  double centre = 0.0;     // centre column at the lane's top, relative to the frame's left edge
  int width = 30;          // lane (band) width in pixels
  std::vector<BandSpec> bands;
};

struct FrameSpec {
  cv::Rect rect;               // frame rectangle in the capture (x, y, width, height)
  double level = 0.0;          // frame (membrane) level above the capture background
  std::vector<LaneSpec> lanes;
};

struct CaptureSpec {
  int width = 512;
  int height = 512;
  int channels = 1;              // channels are written as ch0.tif, ch1.tif, ...
  std::vector<FrameSpec> frames;
  double background = 1000.0;    // capture background level (16-bit units)
  double slope = 0.0;            // background change per row (16-bit units)
  double noiseSigma = 0.0;       // Gaussian noise
  double tiltDegrees = 0.0;      // lane tilt (positive: bottom moves right)
  double smile = 0.0;            // band rows bend down by smile * (distance from frame centre)^2
  int dust = 0;                  // number of bright specks
  bool saturate = false;         // clip at 65535 (bands may be driven into saturation)
  bool darkOnBright = false;     // render inverted: 65535 - value
  // Per channel: scale of the band volumes (1.0 when missing); a channel with scale 0 holds
  // only background.
  std::vector<double> channelScale;
  uint32_t seed = 1;
};

struct TruthBand {
  int x1 = 0, y1 = 0, x2 = 0, y2 = 0;  // inclusive box of +-2 sigma around the centre
  double centreRow = 0.0;
  double volume = 0.0;  // as requested; channel c holds volume * channelScale[c]
};

struct TruthLane {
  double centreTop = 0.0;     // centre column at the frame's top row (capture coordinates)
  double centreBottom = 0.0;  // centre column at the frame's bottom row
  int width = 0;
  std::vector<TruthBand> bands;
};

struct TruthFrame {
  int x1 = 0, y1 = 0, x2 = 0, y2 = 0;  // inclusive
  std::vector<TruthLane> lanes;
};

struct Truth {
  int width = 0;
  int height = 0;
  int channels = 1;           // channel files rendered
  std::vector<TruthFrame> frames;
};

// Renders the channels (CV_16UC1 each) and returns the truth.
Truth render(const CaptureSpec& plan, std::vector<cv::Mat>& channels);
// Renders and writes dir/ch0.tif, dir/ch1.tif, ... (dir is created when missing).
Truth writeCapture(const CaptureSpec& plan, const std::string& dir);

// A clean gel: one frame covering most of the image, evenly spaced lanes with well
// separated bands, bright on dark, no tilt, no noise.
CaptureSpec cleanGel(int width, int height, int lanes, int bandsPerLane, uint32_t seed);

// The truth as a JSON "analysisFrame" document (frame, lanes, bands) for requests.
std::string truthFrameJson(const Truth& truth, std::size_t frameIndex);
// A default "ImageParas" document for n channels.
std::string imageParasJson(int channels);

}  // namespace synth
}  // namespace viraduve
