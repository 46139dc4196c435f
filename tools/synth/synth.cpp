// Synthetic captures: frames, lanes and Gaussian bands of known volume on a background,
// rendered into 16-bit channels, with the ground truth the renderer used.
//
// Pixel centres sit on integer coordinates, so a lane centred on column c with an odd width w
// covers columns c - (w-1)/2 .. c + (w-1)/2 symmetrically. Random numbers come from
// std::mt19937 and hand-written conversions only, so a seed gives the same pixels with every
// standard library.
#include "synth.h"

#include <algorithm>
#include <cmath>
#include <filesystem>
#include <random>
#include <sstream>
#include <stdexcept>

#include <opencv2/imgcodecs.hpp>

namespace viraduve {
namespace synth {

namespace {

constexpr double kPi = 3.14159265358979323846;
// Width of the linear ramp on each side of a lane: soft edges as a real lane has.
constexpr double kEdgeRamp = 2.0;
// Rows rendered on each side of a band centre, in sigmas; the rest is below 1e-5 of the peak.
constexpr double kSigmaSpan = 5.0;

class Random {
 public:
  Random(uint32_t seed, uint32_t stream) {
    std::seed_seq seq{seed, stream, 0x5eedu};
    engine_.seed(seq);
  }
  // Uniform in (0, 1), never 0 so that the logarithm below is finite.
  double uniform() { return (static_cast<double>(engine_()) + 0.5) / 4294967296.0; }
  double uniform(double lo, double hi) { return lo + (hi - lo) * uniform(); }
  // Box-Muller; the second value of each pair is kept for the next call.
  double normal() {
    if (hasSpare_) {
      hasSpare_ = false;
      return spare_;
    }
    const double r = std::sqrt(-2.0 * std::log(uniform()));
    const double t = 2.0 * kPi * uniform();
    spare_ = r * std::sin(t);
    hasSpare_ = true;
    return r * std::cos(t);
  }

 private:
  std::mt19937 engine_;
  bool hasSpare_ = false;
  double spare_ = 0.0;
};

// Streams of random numbers, so that adding dust does not change the noise and so on.
constexpr uint32_t kNoiseStream = 1;
constexpr uint32_t kDustStream = 1000;
constexpr uint32_t kLayoutStream = 2000;

double channelScaleOf(const CaptureSpec& plan, int channel) {
  return channel < static_cast<int>(plan.channelScale.size()) ? plan.channelScale[channel] : 1.0;
}

// Geometry of one band as rendered, in capture coordinates.
struct BandGeometry {
  double row = 0.0;          // centre row at the lane centre
  double tanTilt = 0.0;      // horizontal shift of the lane centre per row
  double laneTopRow = 0.0;   // row where the lane centre equals laneTopCol
  double laneTopCol = 0.0;
  double width = 0.0;
  double sigma = 0.0;
  double smile = 0.0;
  double frameCentreX = 0.0;

  double laneCentreAt(double y) const { return laneTopCol + (y - laneTopRow) * tanTilt; }
  // Smile bends every column of the band by its own distance from the frame centre.
  double rowAt(double x) const {
    const double dx = x - frameCentreX;
    const double dc = laneCentreAt(row) - frameCentreX;
    return row + smile * (dx * dx - dc * dc);
  }
};

double laneWeight(double x, double centre, double width) {
  const double w = (width * 0.5 - std::fabs(x - centre)) / kEdgeRamp + 0.5;
  return std::clamp(w, 0.0, 1.0);
}

// Adds a band of the given volume to `acc` (CV_64F), normalised over the pixels that lie in
// the capture, so the added intensity sums to `volume` exactly (before quantisation).
void addBand(cv::Mat& acc, const BandGeometry& g, double volume) {
  if (volume == 0.0 || g.sigma <= 0.0) return;
  double rowHalf = kSigmaSpan * g.sigma + 2.0;
  double colHalf = g.width * 0.5 + kEdgeRamp + std::fabs(g.tanTilt) * rowHalf;
  const double centre = g.laneCentreAt(g.row);
  double smileExtra = 0.0;
  for (double x : {centre - colHalf, centre + colHalf})
    smileExtra = std::max(smileExtra, std::fabs(g.rowAt(x) - g.row));
  rowHalf += smileExtra;
  colHalf = g.width * 0.5 + kEdgeRamp + std::fabs(g.tanTilt) * rowHalf;

  const int y0 = std::max(0, static_cast<int>(std::floor(g.row - rowHalf)));
  const int y1 = std::min(acc.rows - 1, static_cast<int>(std::ceil(g.row + rowHalf)));
  const int x0 = std::max(0, static_cast<int>(std::floor(centre - colHalf)));
  const int x1 = std::min(acc.cols - 1, static_cast<int>(std::ceil(centre + colHalf)));
  if (y0 > y1 || x0 > x1) return;

  cv::Mat patch(y1 - y0 + 1, x1 - x0 + 1, CV_64F);
  std::vector<double> rowOfColumn(patch.cols);
  for (int c = 0; c < patch.cols; ++c) rowOfColumn[c] = g.rowAt(x0 + c);
  const double twoSigma2 = 2.0 * g.sigma * g.sigma;
  double total = 0.0;
  for (int r = 0; r < patch.rows; ++r) {
    const double y = y0 + r;
    const double laneCentre = g.laneCentreAt(y);
    double* p = patch.ptr<double>(r);
    for (int c = 0; c < patch.cols; ++c) {
      const double h = laneWeight(x0 + c, laneCentre, g.width);
      const double d = y - rowOfColumn[c];
      p[c] = h > 0.0 ? h * std::exp(-d * d / twoSigma2) : 0.0;
      total += p[c];
    }
  }
  if (total <= 0.0) return;
  const double k = volume / total;
  for (int r = 0; r < patch.rows; ++r) {
    const double* p = patch.ptr<double>(r);
    double* a = acc.ptr<double>(y0 + r) + x0;
    for (int c = 0; c < patch.cols; ++c) a[c] += k * p[c];
  }
}

void checkSpec(const CaptureSpec& plan) {
  if (plan.width <= 0 || plan.height <= 0) throw std::invalid_argument("synth: empty capture size");
  if (plan.channels <= 0) throw std::invalid_argument("synth: at least one channel is needed");
  for (const FrameSpec& f : plan.frames) {
    if (f.rect.width <= 0 || f.rect.height <= 0)
      throw std::invalid_argument("synth: empty frame rectangle");
    for (const LaneSpec& l : f.lanes) {
      if (l.width <= 0) throw std::invalid_argument("synth: lane width must be positive");
      for (const BandSpec& b : l.bands)
        if (b.sigma <= 0.0) throw std::invalid_argument("synth: band sigma must be positive");
    }
  }
}

std::vector<std::vector<std::vector<BandGeometry>>> layout(const CaptureSpec& plan) {
  const double tanTilt = std::tan(plan.tiltDegrees * kPi / 180.0);
  std::vector<std::vector<std::vector<BandGeometry>>> out;
  for (const FrameSpec& f : plan.frames) {
    out.emplace_back();
    const double frameCentreX = f.rect.x + (f.rect.width - 1) * 0.5;
    for (const LaneSpec& l : f.lanes) {
      out.back().emplace_back();
      for (const BandSpec& b : l.bands) {
        BandGeometry g;
        g.tanTilt = tanTilt;
        g.laneTopRow = f.rect.y;
        g.laneTopCol = f.rect.x + l.centre;
        g.width = l.width;
        g.sigma = b.sigma;
        g.smile = plan.smile;
        g.frameCentreX = frameCentreX;
        g.row = f.rect.y + b.row;
        // The smile moves the band's centre row by the lane's own distance from the centre.
        const double dc = g.laneCentreAt(g.row) - frameCentreX;
        g.row += plan.smile * dc * dc;
        out.back().back().push_back(g);
      }
    }
  }
  return out;
}

Truth makeTruth(const CaptureSpec& plan,
                const std::vector<std::vector<std::vector<BandGeometry>>>& geometry) {
  const double tanTilt = std::tan(plan.tiltDegrees * kPi / 180.0);
  Truth truth;
  truth.width = plan.width;
  truth.height = plan.height;
  truth.channels = plan.channels;
  for (std::size_t fi = 0; fi < plan.frames.size(); ++fi) {
    const FrameSpec& f = plan.frames[fi];
    TruthFrame tf;
    tf.x1 = f.rect.x;
    tf.y1 = f.rect.y;
    tf.x2 = f.rect.x + f.rect.width - 1;
    tf.y2 = f.rect.y + f.rect.height - 1;
    for (std::size_t li = 0; li < f.lanes.size(); ++li) {
      const LaneSpec& l = f.lanes[li];
      TruthLane tl;
      tl.centreTop = f.rect.x + l.centre;
      tl.centreBottom = tl.centreTop + (f.rect.height - 1) * tanTilt;
      tl.width = l.width;
      for (std::size_t bi = 0; bi < l.bands.size(); ++bi) {
        const BandGeometry& g = geometry[fi][li][bi];
        TruthBand tb;
        tb.centreRow = g.row;
        tb.volume = l.bands[bi].volume;
        tb.x1 = static_cast<int>(std::lround(g.laneCentreAt(g.row) - (l.width - 1) * 0.5));
        tb.x2 = tb.x1 + l.width - 1;
        tb.y1 = static_cast<int>(std::lround(g.row - 2.0 * g.sigma));
        tb.y2 = static_cast<int>(std::lround(g.row + 2.0 * g.sigma));
        tl.bands.push_back(tb);
      }
      tf.lanes.push_back(tl);
    }
    truth.frames.push_back(tf);
  }
  return truth;
}

struct Speck {
  int x, y, radius;
  double level;
};

std::vector<Speck> dustSpecks(const CaptureSpec& plan) {
  Random rng(plan.seed, kDustStream);
  std::vector<Speck> specks;
  for (int i = 0; i < plan.dust; ++i) {
    Speck s;
    s.x = std::min(plan.width - 1, static_cast<int>(rng.uniform() * plan.width));
    s.y = std::min(plan.height - 1, static_cast<int>(rng.uniform() * plan.height));
    s.radius = rng.uniform() < 0.5 ? 1 : 2;
    s.level = rng.uniform(40000.0, 65535.0);
    specks.push_back(s);
  }
  return specks;
}

cv::Mat renderChannel(const CaptureSpec& plan, int channel,
                      const std::vector<std::vector<std::vector<BandGeometry>>>& geometry,
                      const std::vector<Speck>& specks) {
  cv::Mat acc(plan.height, plan.width, CV_64F);
  for (int y = 0; y < acc.rows; ++y) {
    double* a = acc.ptr<double>(y);
    const double level = plan.background + plan.slope * y;
    for (int x = 0; x < acc.cols; ++x) a[x] = level;
  }
  const double scale = channelScaleOf(plan, channel);
  const cv::Rect whole(0, 0, plan.width, plan.height);
  for (std::size_t fi = 0; fi < plan.frames.size(); ++fi) {
    const FrameSpec& f = plan.frames[fi];
    if (f.level != 0.0) {
      cv::Mat inside = acc(f.rect & whole);
      inside += f.level;
    }
    for (std::size_t li = 0; li < f.lanes.size(); ++li)
      for (std::size_t bi = 0; bi < f.lanes[li].bands.size(); ++bi)
        addBand(acc, geometry[fi][li][bi], f.lanes[li].bands[bi].volume * scale);
  }
  if (plan.noiseSigma > 0.0) {
    Random rng(plan.seed, kNoiseStream + static_cast<uint32_t>(channel));
    for (int y = 0; y < acc.rows; ++y) {
      double* a = acc.ptr<double>(y);
      for (int x = 0; x < acc.cols; ++x) a[x] += plan.noiseSigma * rng.normal();
    }
  }
  for (const Speck& s : specks) {
    for (int y = std::max(0, s.y - s.radius); y <= std::min(plan.height - 1, s.y + s.radius); ++y) {
      double* a = acc.ptr<double>(y);
      for (int x = std::max(0, s.x - s.radius); x <= std::min(plan.width - 1, s.x + s.radius); ++x)
        if ((x - s.x) * (x - s.x) + (y - s.y) * (y - s.y) <= s.radius * s.radius)
          a[x] = std::max(a[x], s.level);
    }
  }

  cv::Mat out(plan.height, plan.width, CV_16UC1);
  for (int y = 0; y < acc.rows; ++y) {
    const double* a = acc.ptr<double>(y);
    uint16_t* o = out.ptr<uint16_t>(y);
    for (int x = 0; x < acc.cols; ++x) {
      double v = std::round(a[x]);
      if (v > 65535.0) {
        // Silent clipping would make the truth volumes wrong.
        if (!plan.saturate)
          throw std::invalid_argument("synth: intensity above 65535; set saturate to clip");
        v = 65535.0;
      }
      v = std::max(v, 0.0);
      const auto value = static_cast<uint16_t>(v);
      o[x] = plan.darkOnBright ? static_cast<uint16_t>(65535 - value) : value;
    }
  }
  return out;
}

void appendUint(std::ostringstream& os, const char* key, long value) {
  if (value < 0) value = 0;  // the documents hold unsigned coordinates
  os << '"' << key << "\": " << value;
}

}  // namespace

Truth render(const CaptureSpec& plan, std::vector<cv::Mat>& channels) {
  checkSpec(plan);
  const auto geometry = layout(plan);
  const auto specks = dustSpecks(plan);
  channels.clear();
  for (int c = 0; c < plan.channels; ++c) channels.push_back(renderChannel(plan, c, geometry, specks));
  return makeTruth(plan, geometry);
}

Truth writeCapture(const CaptureSpec& plan, const std::string& dir) {
  std::vector<cv::Mat> channels;
  Truth truth = render(plan, channels);
  std::filesystem::create_directories(dir);
  for (std::size_t c = 0; c < channels.size(); ++c) {
    const std::string path = dir + "/ch" + std::to_string(c) + ".tif";
    if (!cv::imwrite(path, channels[c])) throw std::runtime_error("synth: cannot write " + path);
  }
  return truth;
}

CaptureSpec cleanGel(int width, int height, int lanes, int bandsPerLane, uint32_t seed) {
  if (width <= 0 || height <= 0 || lanes <= 0 || bandsPerLane < 0)
    throw std::invalid_argument("synth: invalid clean gel size");
  CaptureSpec plan;
  plan.width = width;
  plan.height = height;
  plan.seed = seed;
  plan.background = 2000.0;

  FrameSpec frame;
  const int mx = static_cast<int>(std::lround(width * 0.05));
  const int my = static_cast<int>(std::lround(height * 0.05));
  frame.rect = cv::Rect(mx, my, width - 2 * mx, height - 2 * my);
  frame.level = 0.0;

  const double spacing = static_cast<double>(frame.rect.width) / lanes;
  // Odd widths keep a lane symmetric about its (integer) centre column.
  int laneWidth = static_cast<int>(spacing * 0.6);
  if (laneWidth % 2 == 0) --laneWidth;
  laneWidth = std::max(laneWidth, 1);
  // Bands sit in the middle 80 % of the frame, evenly spaced, at least three band heights
  // (4 sigma each) apart: many bands get narrower rather than merge.
  const double top = frame.rect.height * 0.1;
  const double span = frame.rect.height * 0.8;
  const double step = bandsPerLane > 0 ? span / bandsPerLane : 0.0;
  double sigma = std::max(1.5, 4.0 * height / 512.0);
  if (bandsPerLane > 0) sigma = std::min(sigma, step / 12.0);
  if (sigma < 1.0) throw std::invalid_argument("synth: too many bands for the gel height");

  Random rng(seed, kLayoutStream);
  for (int l = 0; l < lanes; ++l) {
    LaneSpec lane;
    lane.centre = std::floor(spacing * (l + 0.5));
    lane.width = laneWidth;
    for (int b = 0; b < bandsPerLane; ++b) {
      BandSpec band;
      band.row = std::round(top + step * (b + 0.5));
      band.sigma = sigma;
      // Peak = volume / (sqrt(2 pi) sigma * width); aim at 20000-40000 above the background.
      const double peak = rng.uniform(20000.0, 40000.0);
      band.volume = std::round(peak * std::sqrt(2.0 * kPi) * sigma * laneWidth);
      lane.bands.push_back(band);
    }
    frame.lanes.push_back(lane);
  }
  plan.frames.push_back(frame);
  return plan;
}

std::string truthFrameJson(const Truth& truth, std::size_t frameIndex) {
  if (frameIndex >= truth.frames.size()) throw std::out_of_range("synth: no such frame");
  const TruthFrame& f = truth.frames[frameIndex];
  // Bands are grouped by channel within a lane, as the library merges them.
  std::ostringstream os;
  const std::string fid = "frame" + std::to_string(frameIndex);
  os << "{\n  \"analysisFrame\": {\n    ";
  appendUint(os, "x1", f.x1); os << ", "; appendUint(os, "y1", f.y1); os << ", ";
  appendUint(os, "x2", f.x2); os << ", "; appendUint(os, "y2", f.y2); os << ", ";
  appendUint(os, "x3", f.x2); os << ", "; appendUint(os, "y3", f.y1); os << ", ";
  appendUint(os, "x4", f.x1); os << ", "; appendUint(os, "y4", f.y2); os << ",\n";
  os << "    \"sensitivity\": [],\n    \"uid\": \"" << fid << "\",\n    \"roiList\": [";
  for (std::size_t li = 0; li < f.lanes.size(); ++li) {
    const TruthLane& l = f.lanes[li];
    const std::string lid = fid + "-lane" + std::to_string(li);
    os << (li ? "," : "") << "\n      {\"lane\": {";
    appendUint(os, "x1", std::lround(l.centreTop)); os << ", "; appendUint(os, "y1", f.y1); os << ", ";
    appendUint(os, "x2", std::lround(l.centreBottom)); os << ", "; appendUint(os, "y2", f.y2); os << ", ";
    appendUint(os, "width", l.width);
    os << ", \"update_flag\": false, \"uid\": \"" << lid << "\"},\n       \"bands\": [";
    bool first = true;
    for (int c = 0; c < truth.channels; ++c) {
      for (std::size_t bi = 0; bi < l.bands.size(); ++bi) {
        const TruthBand& b = l.bands[bi];
        os << (first ? "" : ",") << "\n         {";
        first = false;
        appendUint(os, "x1", b.x1); os << ", "; appendUint(os, "y1", b.y1); os << ", ";
        appendUint(os, "x2", b.x2); os << ", "; appendUint(os, "y2", b.y2); os << ", ";
        appendUint(os, "channel", c);
        os << ", \"uid\": \"" << lid << "-band" << bi << "-ch" << c << "\"}";
      }
    }
    os << "]}";
  }
  os << "]\n  }\n}\n";
  return os.str();
}

std::string imageParasJson(int channels) {
  if (channels < 0) throw std::invalid_argument("synth: negative channel count");
  // Display colours: white for a single channel, else red, green, blue, ... in turn.
  static const int kColours[][3] = {{255, 0, 0}, {0, 255, 0}, {0, 0, 255}, {255, 255, 0}};
  std::ostringstream os;
  os << "{\"ImageParas\": [";
  for (int c = 0; c < channels; ++c) {
    const int* rgb = channels == 1 ? nullptr : kColours[c % 4];
    os << (c ? "," : "") << "\n  {\"img_angle\": 0.0, \"img_gamma\": 1.0, \"brightness\": 0, "
       << "\"img_invert\": false, \"img_max\": 65535, \"img_min\": 0, "
       << "\"r\": " << (rgb ? rgb[0] : 255) << ", \"g\": " << (rgb ? rgb[1] : 255)
       << ", \"b\": " << (rgb ? rgb[2] : 255) << ", "
       << "\"img_flip_h\": false, \"img_flip_v\": false, \"saturation\": false, "
       << "\"backgroundInverted\": false, \"auto_contrast\": false, \"channelAppMode\": \"chemi\", "
       << "\"digitalZoom\": 1.0, \"opticalZoom\": 1.0, \"binning\": 3, "
       << "\"backgroundDetection\": \"black\"}";
  }
  os << "\n]}\n";
  return os.str();
}

}  // namespace synth
}  // namespace viraduve
