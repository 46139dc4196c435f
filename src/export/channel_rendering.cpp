// Display rendering of one channel and the merge of channels.
#include "export/channel_rendering.h"

#include <algorithm>
#include <cmath>
#include <cstdint>
#include <vector>

#include <opencv2/imgproc.hpp>

namespace viraduve {
namespace Export {

namespace {

constexpr int kRed = 2;

bool isColour(const CloudImageParam& p, int r, int g, int b) {
  return p.r == r && p.g == g && p.b == b;
}

int clampComponent(int v) { return std::min(255, std::max(0, v)); }

// Complementary colour of a tinted channel, so the marking stands out inside the channel's own
// colour; red for channels shown in grey, where a complement would be grey too.
cv::Vec3w markingColour(const CloudImageParam& p, ImageMode mode) {
  const cv::Vec3w red(0, 0, 255 * 255);
  if (p.b == 999 || keepsGreyRendering(p, mode, backgroundFlag(p))) return red;
  const int cb = 255 - clampComponent(p.b);
  const int cg = 255 - clampComponent(p.g);
  const int cr = 255 - clampComponent(p.r);
  if (cb == cg && cg == cr) return red;
  // Components scaled as the export scales 8-bit samples to 16 bits.
  return cv::Vec3w(static_cast<ushort>(cb * 255), static_cast<ushort>(cg * 255),
                   static_cast<ushort>(cr * 255));
}

}  // namespace

int backgroundFlag(const CloudImageParam& p) { return p.backgroundDetection == "black" ? -1 : 1; }

cv::Mat displayMapping(const cv::Mat& channel16, const CloudImageParam& p) {
  cv::Mat f;
  channel16.convertTo(f, CV_32F);
  f = f / 65535.0;
  f = f - p.img_min / 65535.0;
  f = f / ((p.img_max - p.img_min) / 65535.0);
  f = cv::max(f, 0.0);
  f = cv::min(f, 1.0);
  cv::pow(f, p.img_gamma, f);
  f = f * 65535.0;
  cv::Mat out;
  f.convertTo(out, CV_16U);
  return out;
}

bool keepsGreyRendering(const CloudImageParam& p, ImageMode mode, int backgroundFlag) {
  const bool black = isColour(p, 0, 0, 0);
  const bool white = isColour(p, 255, 255, 255);
  if (mode == ImageMode_Universal && p.channelAppMode == ChType_Chemi && (black || white)) return true;
  if (p.b == 999) return true;
  if (black && backgroundFlag == 1) return true;
  if (white && backgroundFlag == -1) return true;
  return false;
}

cv::Mat tintChannel(const cv::Mat& grey8c3, int r, int g, int b, int backgroundFlag) {
  CV_Assert(grey8c3.type() == CV_8UC3);
  const bool black = r == 0 && g == 0 && b == 0;
  const bool white = r == 255 && g == 255 && b == 255;
  if ((black && backgroundFlag == -1) || (white && backgroundFlag == 1)) {
    return cv::Mat(grey8c3.size(), CV_8UC3, cv::Scalar(b, g, r));
  }
  cv::Mat c(grey8c3.size(), CV_8UC3, cv::Scalar(b, g, r));
  cv::cvtColor(c, c, cv::COLOR_BGR2HSV);
  for (int y = 0; y < c.rows; ++y) {
    cv::Vec3b* hsv = c.ptr<cv::Vec3b>(y);
    const cv::Vec3b* grey = grey8c3.ptr<cv::Vec3b>(y);
    if (backgroundFlag == -1) {
      for (int x = 0; x < c.cols; ++x) hsv[x][2] = grey[x][0];
    } else {
      for (int x = 0; x < c.cols; ++x) hsv[x][1] = static_cast<uchar>(255 - grey[x][0]);
    }
  }
  cv::cvtColor(c, c, cv::COLOR_HSV2BGR);
  cv::Mat out;
  if (backgroundFlag == -1) {
    cv::min(c, grey8c3, out);
  } else {
    cv::max(c, grey8c3, out);
  }
  return out;
}

void blendChannel(cv::Mat& merged8c3, const cv::Mat& next8c3, bool multiply) {
  CV_Assert(merged8c3.type() == CV_8UC3 && next8c3.type() == CV_8UC3 &&
            merged8c3.size() == next8c3.size());
  const int n = merged8c3.cols * 3;
  for (int y = 0; y < merged8c3.rows; ++y) {
    uchar* a = merged8c3.ptr<uchar>(y);
    const uchar* c = next8c3.ptr<uchar>(y);
    for (int i = 0; i < n; ++i) {
      const double av = a[i] / 255.0;
      const double nv = c[i] / 255.0;
      const double v = multiply ? av * nv : 1.0 - (1.0 - av) * (1.0 - nv);
      a[i] = static_cast<uchar>(static_cast<int>(v * 255.0));
    }
  }
}

cv::Mat saturationMask(const cv::Mat& channel16, const CloudImageParam& p, ImageMode, int) {
  CV_Assert(channel16.type() == CV_16UC1);
  // An inverted copy holds the sensor's limit 65535 as 0.
  const ushort limit = p.img_invert ? 0 : 65535;
  cv::Mat mask(channel16.size(), CV_8UC1);
  for (int y = 0; y < channel16.rows; ++y) {
    const ushort* v = channel16.ptr<ushort>(y);
    uchar* m = mask.ptr<uchar>(y);
    for (int x = 0; x < channel16.cols; ++x) m[x] = v[x] == limit ? 255 : 0;
  }
  return mask;
}

cv::Mat markSaturation(const cv::Mat& rendered16, const cv::Mat& mask, const CloudImageParam& p,
                       ImageMode mode, int) {
  CV_Assert(rendered16.depth() == CV_16U && mask.type() == CV_8UC1 &&
            rendered16.size() == mask.size());
  cv::Mat out;
  if (rendered16.channels() == 1) {
    cv::cvtColor(rendered16, out, cv::COLOR_GRAY2BGR);
  } else {
    out = rendered16.clone();
  }
  const cv::Vec3w colour = markingColour(p, mode);
  for (int y = 0; y < out.rows; ++y) {
    cv::Vec3w* px = out.ptr<cv::Vec3w>(y);
    const uchar* m = mask.ptr<uchar>(y);
    for (int x = 0; x < out.cols; ++x) {
      if (m[x]) px[x] = colour;
    }
  }
  return out;
}

void autoContrastWindow(const cv::Mat& channel16, CloudImageParam& p, ImageMode, int) {
  CV_Assert(channel16.type() == CV_16UC1);
  const uint64_t n = channel16.total();
  if (n == 0) return;
  std::vector<uint64_t> hist(65536, 0);
  for (int y = 0; y < channel16.rows; ++y) {
    const ushort* v = channel16.ptr<ushort>(y);
    for (int x = 0; x < channel16.cols; ++x) ++hist[v[x]];
  }
  // At most 0.1 % of the samples may clip at either end: dust and hot pixels do not
  // stretch the window, saturated bands still reach white.
  const uint64_t clip = static_cast<uint64_t>(static_cast<double>(n) * 0.001);
  int lo = 0;
  uint64_t count = 0;
  for (int v = 0; v < 65536; ++v) {
    count += hist[v];
    if (count > clip) {
      lo = v;
      break;
    }
  }
  int hi = 65535;
  count = 0;
  for (int v = 65535; v >= 0; --v) {
    count += hist[v];
    if (count > clip) {
      hi = v;
      break;
    }
  }
  // A flat picture still needs a window of at least one grey level.
  if (hi <= lo) {
    if (lo >= 65535) lo = 65534;
    hi = lo + 1;
  }
  p.img_min = lo;
  p.img_max = hi;
}

cv::Mat channelStep(const cv::Mat& channel16, const CloudImageParam&, ImageMode, int) {
  CV_Assert(channel16.type() == CV_16UC1);
  if (channel16.empty()) return channel16.clone();
  // The background is estimated on a reduced copy: it varies slowly, and the opening with a
  // kernel of an eighth of the picture would be costly at full size.
  const int longSide = std::max(channel16.rows, channel16.cols);
  const double f = longSide > 256 ? 256.0 / longSide : 1.0;
  const cv::Size smallSize(std::max(1, static_cast<int>(std::lround(channel16.cols * f))),
                           std::max(1, static_cast<int>(std::lround(channel16.rows * f))));
  cv::Mat small;
  cv::resize(channel16, small, smallSize, 0, 0, cv::INTER_AREA);
  const int k = std::max(3, (std::min(small.rows, small.cols) / 8) | 1);
  cv::Mat background;
  cv::morphologyEx(small, background, cv::MORPH_OPEN,
                   cv::getStructuringElement(cv::MORPH_RECT, cv::Size(k, k)));
  cv::blur(background, background, cv::Size(k, k));
  double floorLevel = 0.0;
  cv::minMaxLoc(background, &floorLevel);
  cv::Mat full;
  cv::resize(background, full, channel16.size(), 0, 0, cv::INTER_LINEAR);
  // Only the rise of the background above its lowest level is removed, so the picture keeps
  // its overall level (a mild correction, not a background subtraction).
  const int base = static_cast<int>(floorLevel);
  cv::Mat out(channel16.size(), CV_16UC1);
  for (int y = 0; y < out.rows; ++y) {
    const ushort* v = channel16.ptr<ushort>(y);
    const ushort* b = full.ptr<ushort>(y);
    ushort* o = out.ptr<ushort>(y);
    for (int x = 0; x < out.cols; ++x) {
      const int value = static_cast<int>(v[x]) - (static_cast<int>(b[x]) - base);
      o[x] = static_cast<ushort>(std::min(65535, std::max(0, value)));
    }
  }
  return out;
}

}  // namespace Export
}  // namespace viraduve
