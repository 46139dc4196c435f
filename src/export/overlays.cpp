// Overlay drawing: frames, lanes, bands, regions, markers and user annotations, and the
// margins their labels need.
#include "export/overlays.h"

#include <algorithm>
#include <cmath>
#include <cstdio>
#include <map>

#include <opencv2/imgproc.hpp>

#include "common/checked.h"
#include "common/log.h"
#include "export/colours.h"
#include "viraduve/Image.h"

namespace viraduve {
namespace Export {

namespace {

constexpr int kFont = cv::FONT_HERSHEY_SIMPLEX;
constexpr double kPiFifth = 0.628318530718;

int truncInt(double v) { return static_cast<int>(std::trunc(v)); }

cv::Size textSize(const std::string& text, double fontScale, int thickness) {
  int baseline = 0;
  return cv::getTextSize(text, kFont, fontScale, thickness, &baseline);
}

void label(cv::Mat& picture, const std::string& text, cv::Point origin, const cv::Scalar& colour,
           double fontScale, int thickness) {
  cv::putText(picture, text, origin, kFont, fontScale, colour, thickness, cv::LINE_8);
}

void line(cv::Mat& picture, cv::Point a, cv::Point b, const cv::Scalar& colour, int thickness) {
  cv::line(picture, a, b, colour, thickness, cv::LINE_AA);
}

// A frame edge between a and b (same row) that passes through the corner mid: a parabola when
// mid lies strictly between them, otherwise two straight pieces.
void curvedEdge(cv::Mat& picture, cv::Point a, cv::Point mid, cv::Point b,
                const cv::Scalar& colour, int thickness) {
  if (!(a.x < mid.x && mid.x < b.x)) {
    line(picture, a, mid, colour, thickness);
    line(picture, mid, b, colour, thickness);
    return;
  }
  const double k = static_cast<double>(mid.y - a.y) / (static_cast<double>(mid.x - a.x) * (mid.x - b.x));
  const int step = std::max(1, (b.x - a.x) / 64);
  std::vector<cv::Point> points;
  for (int x = a.x; x < b.x; x += step) {
    points.emplace_back(x, static_cast<int>(std::lround(a.y + k * (x - a.x) * (x - b.x))));
  }
  points.push_back(b);
  cv::polylines(picture, points, false, colour, thickness, cv::LINE_AA);
}

enum class LaneKind { Normal, Reference, Normalised, Excluded };

struct LaneLook {
  LaneKind kind = LaneKind::Normal;
  const TpnExportLane* volume = nullptr;  // lane-volume boxes of reference and normalised lanes
};

// Lane uids are unique across frames, so the lane is looked up in every normalisation frame.
LaneLook classifyLane(const std::string& uid, const std::vector<TpnExportFrame>& normalisation) {
  for (const TpnExportFrame& f : normalisation) {
    for (const TpnExportLane& l : f.excludedLanes) {
      if (equalsNoCase(l.uid, uid)) return {LaneKind::Excluded, nullptr};
    }
  }
  for (const TpnExportFrame& f : normalisation) {
    if (equalsNoCase(f.referanceLane.uid, uid)) return {LaneKind::Reference, &f.referanceLane};
  }
  for (const TpnExportFrame& f : normalisation) {
    for (const TpnExportLane& l : f.normalizeLanes) {
      if (equalsNoCase(l.uid, uid)) return {LaneKind::Normalised, &l};
    }
  }
  return {};
}

// The top and bottom edges of the lane-volume range as brackets whose ticks point into it.
void drawLaneVolume(cv::Mat& picture, const TpnExportLane& volume, ScalePair scale,
                    const cv::Scalar& colour, int thickness) {
  const int tick = truncInt(5 * scale.x);
  const int top = static_cast<int>(volume.laneVolTop.y1);
  const int tl = static_cast<int>(volume.laneVolTop.x1);
  const int tr = static_cast<int>(volume.laneVolTop.x2);
  line(picture, {tl, top}, {tr, top}, colour, thickness);
  line(picture, {tl, top}, {tl, top + tick}, colour, thickness);
  line(picture, {tr, top}, {tr, top + tick}, colour, thickness);
  const int bottom = static_cast<int>(volume.laneVolBottom.y2);
  const int bl = static_cast<int>(volume.laneVolBottom.x1);
  const int br = static_cast<int>(volume.laneVolBottom.x2);
  line(picture, {bl, bottom}, {br, bottom}, colour, thickness);
  line(picture, {bl, bottom}, {bl, bottom - tick}, colour, thickness);
  line(picture, {br, bottom}, {br, bottom - tick}, colour, thickness);
}

void drawFrame(cv::Mat& picture, const CloudFrame& frame, int number, ScalePair scale,
               double fontScale, int fontThickness, int shapeThickness) {
  const cv::Scalar colour = hexToScalar(colours::kFrame);
  const std::string name = "F" + std::to_string(number);
  const cv::Point offset = frameNumberOffset(name, scale, fontScale, fontThickness);
  const cv::Size text = textSize(name, fontScale, fontThickness);
  int x1 = static_cast<int>(frame.x1);
  int y1 = static_cast<int>(frame.y1);
  int x2 = static_cast<int>(frame.x2);
  int y2 = static_cast<int>(frame.y2);
  const int x3 = static_cast<int>(frame.x3);
  int y3 = static_cast<int>(frame.y3);
  const int x4 = static_cast<int>(frame.x4);
  int y4 = static_cast<int>(frame.y4);
  label(picture, name, {x1 - offset.x, y1 + text.height - offset.y}, colour, fontScale,
        fontThickness);
  // Edges on the picture's border would be cut off; pull them inside.
  if (x1 < 3) x1 = 2;
  if (y1 < 3) y1 = 2;
  if (y3 < 3) y3 = 2;
  if (x2 >= picture.cols - 4) x2 = picture.cols - 4;
  if (y2 >= picture.rows - 4) y2 = picture.rows - 4;
  if (y4 >= picture.rows - 4) y4 = picture.rows - 4;
  line(picture, {x1, y1}, {x1, y2}, colour, shapeThickness);
  line(picture, {x2, y1}, {x2, y2}, colour, shapeThickness);
  if (y3 == y1) {
    line(picture, {x1, y1}, {x2, y1}, colour, shapeThickness);
  } else {
    curvedEdge(picture, {x1, y1}, {x3, y3}, {x2, y1}, colour, shapeThickness);
  }
  // The bottom closes the outline, bent through the fourth corner like the top.
  if (y4 == y2) {
    line(picture, {x1, y2}, {x2, y2}, colour, shapeThickness);
  } else {
    curvedEdge(picture, {x1, y2}, {x4, y4}, {x2, y2}, colour, shapeThickness);
  }
}

void drawLane(cv::Mat& picture, const CloudLane& lane, int number,
              const std::vector<TpnExportFrame>& normalisation, ScalePair scale, double fontScale,
              int fontThickness, int shapeThickness) {
  const cv::Point top(static_cast<int>(lane.x1), static_cast<int>(lane.y1));
  const cv::Point bottom(static_cast<int>(lane.x2), static_cast<int>(lane.y2));
  label(picture, std::to_string(number),
        {top.x + truncInt(2 * scale.x), top.y + truncInt(15 * scale.y)}, hexToScalar(colours::kLane),
        fontScale, fontThickness);
  const LaneLook look = classifyLane(lane.uid, normalisation);
  if (look.kind == LaneKind::Excluded) {
    line(picture, top, bottom, hexToScalar(colours::kExcludedLane), shapeThickness);
  } else {
    const cv::Scalar colour = hexToScalar(look.kind == LaneKind::Reference ? colours::kReferenceLane
                                                                           : colours::kLane);
    line(picture, top, bottom, colour, shapeThickness);
    if (look.volume != nullptr) drawLaneVolume(picture, *look.volume, scale, colour, shapeThickness + 1);
  }
  // Bands that band filtering rejected keep their box but get no number; a lane holds the
  // bands of every channel, each channel numbered on its own.
  const cv::Scalar bandColour = hexToScalar(colours::kBand);
  std::map<uint32_t, int> bandNumbers;
  for (const CloudBand& band : lane.bands) {
    const cv::Point p1(static_cast<int>(band.x1), static_cast<int>(band.y1));
    const cv::Point p2(static_cast<int>(band.x2), static_cast<int>(band.y2));
    cv::rectangle(picture, p1, p2, bandColour, shapeThickness, cv::LINE_8);
    if (band.band_s_x >= 0.0) {
      label(picture, std::to_string(++bandNumbers[band.channel]),
            {p1.x, p1.y - truncInt(2 * scale.y)}, bandColour, fontScale, fontThickness);
    }
  }
}

bool hasFill(const std::string& fillColor) {
  return !fillColor.empty() && !equalsNoCase(fillColor, "#E9EBEC");
}

// Lays an 8UC4 layer over the picture at (x, y), blending by its alpha.
void blendLayer(cv::Mat& picture, const cv::Mat& layer, int x, int y) {
  const cv::Rect target = cv::Rect(x, y, layer.cols, layer.rows) & cv::Rect(0, 0, picture.cols, picture.rows);
  for (int r = target.y; r < target.y + target.height; ++r) {
    cv::Vec3b* dst = picture.ptr<cv::Vec3b>(r);
    const cv::Vec4b* src = layer.ptr<cv::Vec4b>(r - y);
    for (int c = target.x; c < target.x + target.width; ++c) {
      const cv::Vec4b& s = src[c - x];
      const int alpha = s[3];
      if (alpha == 0) continue;
      for (int k = 0; k < 3; ++k) {
        dst[c][k] = static_cast<uchar>((dst[c][k] * (255 - alpha) + s[k] * alpha + 127) / 255);
      }
    }
  }
}

void drawTextAnnotation(cv::Mat& picture, const Annotation& a, double scaleY) {
  const cv::Size unitA = textSize("A", 1.0, 1);
  double fontScale = a.exportTextSize / static_cast<double>(unitA.height) * scaleY;
  // An absurd text size gives 32768, which drawing refuses with an error, not an overflow.
  const int thickness = static_cast<int>(std::min(std::max(std::ceil(fontScale), 0.0), 32768.0));
  textAnnotationSizeForBox(a, fontScale, thickness);

  const int left = std::min(a.x1, a.x2);
  const int right = std::max(a.x1, a.x2);
  const int top = std::min(a.y1, a.y2);
  const int bottom = std::max(a.y1, a.y2);
  const bool drawText = thickness > 0 && fontScale > 0.0 && !a.text.empty();

  // Text lines: a padding of 0.15 "A" widths on the left (the box keeps 0.3 of them free),
  // half a line gap above the first line.
  int baseline = 0;
  const cv::Size letter = drawText ? cv::getTextSize("A", kFont, fontScale, thickness, &baseline) : cv::Size();
  const int gap = truncInt(5 * fontScale);
  const int textX = left + truncInt(0.15 * letter.width);
  std::vector<cv::Point> origins;
  int contentRight = right;
  int contentBottom = bottom;
  if (drawText) {
    int y = top + gap / 2 + letter.height;
    for (const std::string& t : a.text) {
      origins.emplace_back(textX, y);
      contentRight = std::max(contentRight, textX + textSize(t, fontScale, thickness).width);
      contentBottom = std::max(contentBottom, y + baseline + thickness);
      y += gap + letter.height;
    }
  }

  // The layer is centred on the box so that the rotation turns the annotation about its own
  // centre.
  const int cx = left + (right - left) / 2;
  const int cy = top + (bottom - top) / 2;
  // Nothing farther from the centre than the picture's farthest corner can land on it.
  const int reach = static_cast<int>(std::ceil(std::hypot(std::max(cx, picture.cols - cx),
                                                          std::max(cy, picture.rows - cy)))) + 1;
  const int hw = std::min(std::max(cx - left, contentRight - cx) + 1, reach);
  const int hh = std::min(std::max(cy - top, contentBottom - cy) + 1, reach);
  const int ox = cx - hw;
  const int oy = cy - hh;
  cv::Mat layer(2 * hh + 1, 2 * hw + 1, CV_8UC4, cv::Scalar::all(0));
  if (hasFill(a.fillColor)) {
    cv::Scalar fill = hexToScalar(a.fillColor);
    fill[3] = 255;
    cv::rectangle(layer, {a.x1 - ox, a.y1 - oy}, {a.x2 - ox, a.y2 - oy}, fill, cv::FILLED,
                  cv::LINE_8);
  }
  cv::Scalar colour = hexToScalar(a.textColor);
  colour[3] = 255;
  for (std::size_t i = 0; i < origins.size(); ++i) {
    cv::putText(layer, a.text[i], origins[i] - cv::Point(ox, oy), kFont, fontScale, colour,
                thickness, cv::LINE_8);
  }
  Image rotated;
  rotated.setMat(layer);
  rotateChannelImage(rotated, rotated, a.angle, -1);
  const cv::Mat& turned = rotated.mat();
  blendLayer(picture, turned, cx - turned.cols / 2, cy - turned.rows / 2);
}

void drawAnnotation(cv::Mat& picture, const Annotation& a, double scaleY, int shapeThickness) {
  const cv::Scalar outline = hexToScalar(a.textColor);
  const cv::Point p1(a.x1, a.y1);
  const cv::Point p2(a.x2, a.y2);
  if (equalsNoCase(a.type, "text")) {
    drawTextAnnotation(picture, a, scaleY);
  } else if (equalsNoCase(a.type, "shape")) {
    if (hasFill(a.fillColor)) cv::rectangle(picture, p1, p2, hexToScalar(a.fillColor), cv::FILLED);
    cv::rectangle(picture, p1, p2, outline, shapeThickness, cv::LINE_AA);
  } else if (equalsNoCase(a.type, "arrow")) {
    line(picture, p1, p2, outline, shapeThickness);
    const float theta = std::atan2(static_cast<float>(a.y2 - a.y1), static_cast<float>(a.x2 - a.x1));
    // The head keeps 18 pixels whatever the picture's scale.
    const cv::Point s1(a.x2 - truncInt(std::cos(theta - kPiFifth) * 18),
                       a.y2 - truncInt(std::sin(theta - kPiFifth) * 18));
    const cv::Point s2(a.x2 - truncInt(std::cos(theta + kPiFifth) * 18),
                       truncInt(a.y2 - std::sin(theta + kPiFifth) * 18));
    line(picture, s1, p2, outline, shapeThickness);
    line(picture, s2, p2, outline, shapeThickness);
  } else if (equalsNoCase(a.type, "line")) {
    line(picture, p1, p2, outline, shapeThickness);
  }
}

bool drawnType(const std::string& type) {
  return equalsNoCase(type, "text") || equalsNoCase(type, "shape") ||
         equalsNoCase(type, "arrow") || equalsNoCase(type, "line");
}

bool channelMatches(uint32_t annotationChannel, int pictureChannel) {
  // The merged picture is channel -1, which an unsigned request value matches only as 2^32 - 1.
  return annotationChannel == static_cast<uint32_t>(pictureChannel);
}

}  // namespace

cv::Point frameNumberOffset(const std::string& name, ScalePair scale, double fontScale,
                            int thickness) {
  const cv::Size text = textSize(name, fontScale, thickness);
  const int ax = truncInt(5 * scale.x);
  const int ay = truncInt(5 * scale.y);
  logLine("scaleAxis(5, scale_ratio.width ) = ", ax);
  logLine("scaleAxis(5, scale_ratio.height) = ", ay);
  logLine("scale_ratio.width = ", scale.x);
  logLine("scale_ratio.height = ", scale.y);
  const cv::Point offset(ax + text.width, ay + text.height);
  logLine("drawLaneBands::FrameNumberOffset.x1 = ", offset.x);
  logLine("drawLaneBands::FrameNumberOffset.y1 = ", offset.y);
  return offset;
}

void calculateFrameNameOffset(Offset& offset, const std::vector<CloudFrame>& frames,
                              ScalePair scale, cv::Size unscaled, double fontScale,
                              int thickness) {
  logLine("calculating frame name offset");
  // Without a usable scale (no print size) there is nothing to make room for.
  if (!(scale.x > 0.0 && scale.y > 0.0 && std::isfinite(scale.x) && std::isfinite(scale.y))) return;
  const double W = unscaled.width;
  const double H = unscaled.height;
  const double r = W / H;
  for (const CloudFrame& frame : frames) {
    const cv::Point labelOffset = frameNumberOffset("F88", scale, fontScale, thickness);
    const double ox = std::trunc(labelOffset.x / scale.x);
    const double oy = std::trunc(labelOffset.y / scale.y);
    const double dx = static_cast<double>(frame.x1) - ox;
    const double dy = static_cast<double>(frame.y1) - oy;
    // A name that needs more than the picture's own size (a scale near zero) is unreadable
    // anyway; the cap keeps the margins, and the picture, bounded.
    const int needX = static_cast<int>(std::min(dx < 0 ? -dx : 0.0, W));
    const int needY = static_cast<int>(std::min(dy < 0 ? -dy : 0.0, H));
    offset.left = offset.right = std::max(needX, std::abs(offset.right)) + 2;
    offset.top = offset.bottom = std::max(needY, std::abs(offset.bottom)) + 2;
    int h = 2 * offset.top + unscaled.height;
    double w = h * r;
    while (w < 2 * offset.left + W || w < W) {
      h += 1;
      w += r;
    }
    offset.left = offset.right = truncInt(w - W) / 2;
    offset.top = offset.bottom = (h - unscaled.height) / 2;
    logLine("Extra space added for frame name: offset.x1 = ", offset.left);
    logLine("offset.y1 = ", offset.top);
  }
}

void calculateAnnotationOffset(Offset& offset, const std::vector<ChannelAnnotations>& annotations,
                               const std::vector<int>& pictureChannels, cv::Size unscaled) {
  double minX = 0.0, minY = 0.0;
  double maxX = unscaled.width - 1.0, maxY = unscaled.height - 1.0;
  for (const ChannelAnnotations& entry : annotations) {
    const bool exported = std::any_of(pictureChannels.begin(), pictureChannels.end(),
                                      [&](int c) { return channelMatches(entry.channel, c); });
    if (!exported) continue;
    for (const Annotation& a : entry.annotations) {
      if (!drawnType(a.type)) continue;
      std::vector<cv::Point2d> corners = {{double(a.x1), double(a.y1)}, {double(a.x2), double(a.y1)},
                                          {double(a.x1), double(a.y2)}, {double(a.x2), double(a.y2)}};
      // A rotated text box reaches as far as its turned corners.
      if (equalsNoCase(a.type, "text") && std::fabs(a.angle) >= 0.001f) {
        const cv::Point2f centre((a.x1 + a.x2) * 0.5f, (a.y1 + a.y2) * 0.5f);
        const cv::Mat m = cv::getRotationMatrix2D(centre, a.angle, 1.0);
        for (cv::Point2d& p : corners) {
          p = {m.at<double>(0, 0) * p.x + m.at<double>(0, 1) * p.y + m.at<double>(0, 2),
               m.at<double>(1, 0) * p.x + m.at<double>(1, 1) * p.y + m.at<double>(1, 2)};
        }
      }
      for (const cv::Point2d& p : corners) {
        minX = std::min(minX, p.x);
        maxX = std::max(maxX, p.x);
        minY = std::min(minY, p.y);
        maxY = std::max(maxY, p.y);
      }
    }
  }
  // Beyond the picture's own size a margin would only blow the picture up: an annotation
  // that far out is clipped instead.
  const auto widen = [](int& side, double reach, int limit) {
    if (reach > 0.0) side = std::max(side, static_cast<int>(std::ceil(std::min<double>(reach, limit))) + 2);
  };
  widen(offset.left, -minX, unscaled.width);
  widen(offset.right, maxX - (unscaled.width - 1), unscaled.width);
  widen(offset.top, -minY, unscaled.height);
  widen(offset.bottom, maxY - (unscaled.height - 1), unscaled.height);
}

void calculateMarkerOffset(Offset& offset, const std::vector<MarkerWeightMap>& markers,
                           ScalePair scale, cv::Size unscaled, double fontScale, int thickness) {
  const double targetWidth = scale.x * unscaled.width;
  // The scale falls as the margin grows, and the labels move further out at smaller scales:
  // settle the margin in a few rounds.
  for (int round = 0; round < 3; ++round) {
    const double sx = targetWidth / (unscaled.width + offset.left + offset.right);
    if (!(sx > 0.0 && std::isfinite(sx))) return;
    const int labelSize = markerLabelSize(sx);
    int need = 0;
    for (const MarkerWeightMap& map : markers) {
      for (const auto& entry : map) {
        if (entry.second.empty()) continue;
        const int width = textSize(markerWeightText(entry.first), fontScale, thickness).width;
        const double reach = (truncInt(labelSize * sx) + truncInt(sx * width)) / sx -
                             entry.second.front().first;
        if (reach > 0.0) {
          need = std::max(need, static_cast<int>(std::ceil(std::min<double>(reach, unscaled.width))) + 2);
        }
      }
    }
    if (need <= offset.left) return;
    offset.left = need;
  }
}

void drawLaneBands(cv::Mat& picture, const std::vector<CloudFrame>& frames,
                   const std::vector<std::vector<CloudLane>>& lanesPerFrame,
                   const std::vector<TpnExportFrame>& normalisation, ScalePair scale,
                   double fontScale, int fontThickness, int shapeThickness) {
  for (std::size_t i = 0; i < frames.size(); ++i) {
    drawFrame(picture, frames[i], static_cast<int>(i + 1), scale, fontScale, fontThickness,
              shapeThickness);
    const std::vector<CloudLane>& lanes = at(lanesPerFrame, i);
    for (std::size_t j = 0; j < lanes.size(); ++j) {
      drawLane(picture, lanes[j], static_cast<int>(j + 1), normalisation, scale, fontScale,
               fontThickness, shapeThickness);
    }
  }
}

void drawRegions(cv::Mat& picture, const std::vector<CloudRegion>& regions, int channel,
                 double fontScale, int thickness) {
  const bool dark = isDarkPicture(picture);
  const cv::Scalar outline = hexToScalar(dark ? colours::kRegionDarkOutline : colours::kRegionLightOutline);
  const cv::Scalar text = hexToScalar(dark ? colours::kRegionDarkLabel : colours::kRegionLightLabel);
  for (const CloudRegion& region : regions) {
    if (region.channel != static_cast<uint32_t>(channel)) continue;
    if (!region.circle_b) {
      const cv::Point p1(static_cast<int>(region.x1), static_cast<int>(region.y1));
      const cv::Point p2(static_cast<int>(region.x2), static_cast<int>(region.y2));
      label(picture, region.refName, {p1.x, p1.y - 5}, text, fontScale, thickness);
      cv::rectangle(picture, p1, p2, outline, thickness, cv::LINE_AA);
    } else {
      const double x = region.x;
      const double y = region.y;
      const double r = region.circle_radius;
      const int w = textSize(region.refName, fontScale, thickness).width;
      const cv::Point origin(static_cast<int>(std::lround(x - r / std::sqrt(2.0) - 0.7 * w - 1.0)),
                             static_cast<int>(std::lround(y - r / std::sqrt(2.0) - 1.0)));
      label(picture, region.refName, origin, text, fontScale, thickness);
      cv::circle(picture, {static_cast<int>(region.x), static_cast<int>(region.y)},
                 static_cast<int>(region.circle_radius), outline, thickness, cv::LINE_AA);
    }
  }
}

int markerLabelSize(double scaleX) {
  if (scaleX < 0.56) return 45;
  if (0.56 < scaleX && scaleX < 1.1) return 30;
  return 11;
}

std::string markerWeightText(float weight) {
  const double w = std::fabs(static_cast<double>(weight));
  char text[64];
  if (w == std::floor(w)) {
    std::snprintf(text, sizeof text, "%.0f", w);
    return text;
  }
  // Three decimals, rounded (0.7f is 0.69999...), without trailing zeros.
  std::snprintf(text, sizeof text, "%.3f", w);
  std::string s = text;
  while (!s.empty() && s.back() == '0') s.pop_back();
  if (!s.empty() && s.back() == '.') s.pop_back();
  return s;
}

void drawMarkers(cv::Mat& picture, const std::vector<MarkerWeightMap>& markers, ScalePair scale,
                 int labelSize, double fontScale, int fontThickness, int shapeThickness) {
  const cv::Scalar colour = hexToScalar(colours::kMarker);
  for (const MarkerWeightMap& map : markers) {
    for (const auto& entry : map) {
      if (entry.second.empty()) continue;
      const int x = entry.second.front().first;
      const int y = entry.second.front().second;
      const std::string text = markerWeightText(entry.first);
      const int tw = textSize(text, fontScale, fontThickness).width;
      label(picture, text,
            {x - truncInt(labelSize * scale.x) - truncInt(scale.x * tw), y + truncInt(5 * scale.y)},
            colour, fontScale, fontThickness);
      line(picture, {x - truncInt(3 * scale.x), y + truncInt(2 * scale.y)},
           {x - truncInt(13 * scale.x), y + truncInt(2 * scale.y)}, colour, shapeThickness);
    }
  }
}

void textAnnotationSizeForBox(const Annotation& annotation, double& fontScale, int thickness) {
  try {
    if (annotation.text.empty()) return;
    const double s = fontScale;
    const int target = truncInt((annotation.x2 - annotation.x1) - 0.3 * textSize("A", s, thickness).width);
    std::size_t widest = 0;
    int widestWidth = -1;
    for (std::size_t i = 0; i < annotation.text.size(); ++i) {
      const int w = textSize(annotation.text[i], s, thickness).width;
      if (w > widestWidth) {
        widest = i;
        widestWidth = w;
      }
    }
    if (widestWidth == target) return;
    double lo = 0.5 * s;
    double hi = s;
    // The search only moves down from s; a line that is narrow already at s would never
    // reach the target, so the tenth halving is accepted whatever it measures.
    for (int halvings = 1;; ++halvings) {
      const double mid = lo + (hi - lo) / 2;
      const int w = textSize(annotation.text[widest], mid, thickness).width;
      if ((w >= target - 2 && w <= target + 2) || halvings > 9) {
        fontScale = mid;
        return;
      }
      if (w < target) {
        lo = mid;
      } else {
        hi = mid;
      }
    }
  } catch (const std::exception&) {
    logLine("Error in function textAnnotationSizeForBox()");
  }
}

void drawAnnotations(cv::Mat& picture, const std::vector<ChannelAnnotations>& annotations,
                     int channel, double scaleY, int shapeThickness) {
  for (const ChannelAnnotations& entry : annotations) {
    if (!channelMatches(entry.channel, channel)) continue;
    for (const Annotation& a : entry.annotations) drawAnnotation(picture, a, scaleY, shapeThickness);
  }
}

}  // namespace Export
}  // namespace viraduve
