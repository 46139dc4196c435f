// Rolling-ball lane background: each lane is reduced to one mean value per row (8-bit scale),
// a ball is rolled under that profile, and the background it traces is subtracted inside the
// lane's strip. The bands are then measured with their rolling measures taken from the
// subtracted image. Lane coordinates come from requests, so every pixel access is clipped to
// the image: pixels outside it contribute nothing.
#include "pipeline/CloudAnalysis.h"

#include <algorithm>
#include <cmath>
#include <cstdint>
#include <limits>

#include "common/channel_files.h"
#include "common/checked.h"
#include "common/log.h"
#include "detector/measure.h"
#include "image/polarity.h"

namespace viraduve {
namespace CloudAnalysis {

namespace {

// The lane's centre column at row y, computed in single precision. A lane with y1 == y2 has
// no direction and is taken as vertical at x1 instead of dividing by zero.
int64_t laneCentre(const Lane2D& lane, int64_t y) {
  if (lane.y2 == lane.y1) return lane.x1;
  float v = static_cast<float>(static_cast<int64_t>(lane.x2) - lane.x1);
  v = v * static_cast<float>(y - lane.y1);
  v = v / static_cast<float>(static_cast<int64_t>(lane.y2) - lane.y1);
  v = v + static_cast<float>(lane.x1);
  // Rows lie between y1 and y2, so v stays between x1 and x2: no overflow in 64 bits.
  return static_cast<int64_t>(std::roundf(v));
}

// Nominal strip around the centre: lo columns to the left, hi to the right.
struct Strip {
  int lo = 0;
  int hi = 0;
};

Strip laneStrip(const Lane2D& lane) {
  const double half = lane.width * 0.5;
  return Strip{static_cast<int>(half - 1.0), static_cast<int>(half)};
}

// Columns of the strip at row y that lie inside an image of the given width (first > last
// when none does).
std::pair<int, int> stripColumns(const Lane2D& lane, const Strip& strip, int64_t y, int cols) {
  const int64_t cx = laneCentre(lane, y);
  const int64_t first = std::max<int64_t>(cx - strip.lo, 0);
  const int64_t last = std::min<int64_t>(cx + strip.hi, static_cast<int64_t>(cols) - 1);
  if (first > last) return {1, 0};
  return {static_cast<int>(first), static_cast<int>(last)};
}

// Abscissae of the crossings of the line y = m x + b with the circle of radius r around
// (cx, cy); disc < 0 when the line misses the circle (the abscissae are then NaN).
struct Crossing {
  double disc = 0.0;
  double xLow = 0.0;
  double xHigh = 0.0;
};

Crossing lineCircle(double m, double b, double cx, double cy, double r) {
  const double a = 1 + m * m;
  const double h = 2 * (m * b - cx - cy * m);
  const double c = cx * cx + cy * cy + b * b - r * r - 2 * cy * b;
  Crossing x;
  x.disc = h * h - 4 * a * c;
  const double root = std::sqrt(x.disc);
  x.xLow = (-h - root) / (2 * a);
  x.xHigh = (-h + root) / (2 * a);
  return x;
}

// (int)(value - background) clamped to 0..255; a non-finite difference counts as 0.
uchar subtractClamped(uchar value, double background) {
  const double v = static_cast<double>(value) - background;
  if (!(v > 0)) return 0;
  if (v >= 255) return 255;
  return static_cast<uchar>(static_cast<int>(v));
}

float relativeMigration(const Band2D& band, const Lane2D& lane) {
  const float centre = static_cast<float>((band.y1 + band.y2) / 2);
  return (centre - static_cast<float>(lane.y1)) /
         (static_cast<float>(lane.y2) - static_cast<float>(lane.y1));
}

}  // namespace

std::vector<double> computeLaneProfile(const cv::Mat& E, const Lane2D& lane) {
  CV_Assert(E.type() == CV_8UC1);
  std::vector<double> profile;
  if (lane.y1 > lane.y2) return profile;
  const Strip strip = laneStrip(lane);
  const int count = strip.lo + strip.hi + 1;
  profile.reserve(static_cast<std::size_t>(static_cast<int64_t>(lane.y2) - lane.y1 + 1));
  for (int64_t y = lane.y1; y <= lane.y2; ++y) {
    double sum = 0.0;
    if (y >= 0 && y < E.rows) {
      const uchar* row = E.ptr<uchar>(static_cast<int>(y));
      const std::pair<int, int> cols = stripColumns(lane, strip, y, E.cols);
      for (int x = cols.first; x <= cols.second; ++x) sum += row[x];
    }
    const double mean = sum / count;
    profile.push_back(std::round(mean * 100) / 100);
  }
  return profile;
}

std::vector<double> rollBall(const std::vector<double>& p, int radius) {
  std::vector<double> background;
  if (p.empty()) return background;
  const int64_t n = static_cast<int64_t>(p.size());
  const double r = radius;
  const int64_t reach = 2 * static_cast<int64_t>(radius);
  background.push_back(p[0]);
  int64_t last = 0;
  for (int64_t i = 1; i <= n - 2; ++i) {
    const double prev = p[i - 1];
    const double cur = p[i];
    const double next = p[i + 1];
    const double di = static_cast<double>(i);
    // Distance of the point from the chord of its neighbours: a corner when it is visible.
    const double d = std::fabs((next - prev) * di - 2 * cur + (di + 1) * prev - (di - 1) * next) /
                     std::sqrt(4 + (next - prev) * (next - prev));
    double s = (next - prev) * 0.5;
    if (std::round(d * 10) / 10 > 0.1) {
      s = 0.01;
    } else if (s == 0) {
      s = 0.01;
    }
    const double m = -1 / s;
    const double b = cur - di * m;

    // The ball centre on the normal through the point, on the side below the profile.
    const Crossing centres = lineCircle(m, b, di, cur, r);
    const double ya = m * centres.xLow + b;
    const double yb = m * centres.xHigh + b;
    const double qx = yb < ya ? centres.xHigh : centres.xLow;
    const double qy = yb < ya ? yb : ya;

    bool contact = true;
    const int64_t kFirst = std::max<int64_t>(0, i - reach + 1);
    const int64_t kLast = std::min<int64_t>(n - 2, i + reach - 1);
    for (int64_t k = kFirst; k <= kLast && contact; ++k) {
      if (k == i) continue;
      const double dk = static_cast<double>(k);
      const double slope = p[k + 1] - p[k];
      const double intercept = p[k] - dk * slope;
      const Crossing x = lineCircle(slope, intercept, qx, qy, r);
      if (x.disc < 0) continue;
      const double dist = std::sqrt((qx - dk) * (qx - dk) + (qy - p[k]) * (qy - p[k]));
      if ((dk <= x.xLow && x.xHigh <= dk + 1) || dist < r) contact = false;
    }
    if (!contact) continue;

    while (static_cast<int64_t>(background.size()) < i) background.push_back(0.0);
    background.push_back(cur);
    const double bi = background[i];
    const double bl = background[last];
    for (int64_t k = last + 1; k <= i - 1; ++k) {
      const double line = (bi - bl) / static_cast<double>(i - last) * static_cast<double>(k - last) + bl;
      background[k] = std::min(std::round(line * 100) / 100, p[k]);
    }
    last = i;
  }
  return background;
}

void subtractLaneBackground(cv::Mat& R, const Lane2D& lane, const std::vector<double>& background) {
  CV_Assert(R.type() == CV_8UC1);
  if (lane.y1 > lane.y2) return;
  const Strip strip = laneStrip(lane);
  const int64_t rows = std::min<int64_t>(static_cast<int64_t>(lane.y2) - lane.y1 + 1,
                                         static_cast<int64_t>(background.size()));
  for (int64_t idx = 0; idx < rows; ++idx) {
    const int64_t y = lane.y1 + idx;
    if (y < 0 || y >= R.rows) continue;
    uchar* row = R.ptr<uchar>(static_cast<int>(y));
    const std::pair<int, int> cols = stripColumns(lane, strip, y, R.cols);
    const double bg = background[static_cast<std::size_t>(idx)];
    for (int x = cols.first; x <= cols.second; ++x) row[x] = subtractClamped(row[x], bg);
  }
}

void analyseLanesWithRollingBall(const Image& image, std::vector<Lane2D>& lanes, uint32_t channel,
                                 const ROI& gbRoi, uint32_t radius) {
  const cv::Mat& decoded = image.mat();
  cv::Mat E;
  decoded.convertTo(E, CV_8U, 0.00390625, 0.0);
  cv::Mat A;
  decoded.convertTo(A, CV_32F, 1.0);

  cv::Mat R = E.clone();
  const int ballRadius = static_cast<int>(std::min<uint32_t>(radius, std::numeric_limits<int>::max() / 4));
  for (const Lane2D& lane : lanes) {
    const std::vector<double> profile = computeLaneProfile(E, lane);
    subtractLaneBackground(R, lane, rollBall(profile, ballRadius));
  }
  // Back to 16-bit units and to float in one pass: 255 * 256 fits 16 bits, so the integer
  // step of the 16-bit image changes no value.
  R.convertTo(R, CV_32F, 256.0);

  const double G = globalBackgroundRect(A, gbRoi);
  logLine("channel_= ", channel);
  logLine("numOfLane = ", lanes.size());

  for (std::size_t i = 0; i < lanes.size(); ++i) {
    Lane2D& lane = lanes[i];
    logLine("lane_", i);
    logLine("x1 = ", lane.x1, ", ", "y1 = ", lane.y1, ", ", "x2 = ", lane.x2, ", ", "y2 = ",
            lane.y2, ", ");
    logLine("lanewidth = ", lane.width);
    logLine("numOfBands = ", lane.bands.size());
    for (std::size_t j = 0; j < lane.bands.size(); ++j) {
      Band2D& band = lane.bands[j];
      logLine("band_", j);
      if (band.channel != channel) continue;
      logLine("x1 = ", band.x1, ", ", "y1 = ", band.y1, ", ", "x2 = ", band.x2, ", ", "y2 = ",
              band.y2);
      const BoxMeasures m = measureBox(A, R, ROI{band.x1, band.y1, band.x2, band.y2}, G);
      band.volume = m.volume;
      band.area = m.area;
      band.density = m.density;
      band.median_intensity = m.median_intensity;
      band.local_bg_volume = m.local_bg_volume;
      band.local_bg_density = m.local_bg_density;
      band.rolling_bg_volume = m.rolling_bg_volume;
      band.rolling_bg_density = m.rolling_bg_density;
      band.global_bg_volume = m.global_bg_volume;
      band.global_bg_density = m.global_bg_density;
      band.rf = relativeMigration(band, lane);
      logLine("local_bg_volume = ", band.local_bg_volume);
    }
  }

  // Purities from the rolling measures; an empty divisor gives -1.0.
  for (Lane2D& lane : lanes) {
    float sroll = 0.0f;
    bool hasBand = false;
    for (const Band2D& band : lane.bands) {
      if (band.channel != channel) continue;
      hasBand = true;
      if (band.rolling_bg_volume >= 0) sroll = static_cast<float>(sroll + band.rolling_bg_volume);
    }
    if (!hasBand) continue;
    const float vlane = laneMaskSum(A, lane);
    for (Band2D& band : lane.bands) {
      if (band.channel != channel) continue;
      band.purity_band = sroll == 0.0f ? -1.0 : band.rolling_bg_volume / static_cast<double>(sroll);
      band.purity_lane = vlane == 0.0f ? -1.0 : band.rolling_bg_volume / static_cast<double>(vlane);
    }
  }
}

void runRollingBallAnalysis(const std::string& imageDir,
                            std::vector<std::vector<Lane2D>>& framesLanes,
                            const std::vector<ImageParam>& imageParams, ImageMode imgMode,
                            const ROI& gbRoi, const std::vector<RollingBallSetting>& rollingBall) {
  logLine("In CloudAnalysis::runRollingBallAnalysis().");
  const std::vector<Image> images = loadChannelsForAnalysis(imageDir, imageParams, imgMode);

  // The channel's display parameters (range, gamma) only shape what is shown; the analysis
  // reads the oriented channel image itself, so no adjustment is applied here.
  for (std::size_t c = 0; c < images.size(); ++c) {
    uint32_t radius = 30;
    for (const RollingBallSetting& s : rollingBall) {
      if (s.channel == c) radius = s.radius;
    }
    for (std::vector<Lane2D>& lanes : framesLanes) {
      analyseLanesWithRollingBall(images[c], lanes, static_cast<uint32_t>(c), gbRoi, radius);
    }
  }
  logLine("Out CloudAnalysis::runRollingBallAnalysis().");
}

}  // namespace CloudAnalysis
}  // namespace viraduve
