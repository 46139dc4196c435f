// Classifiers, enumeration names and the console printers of the working records.
#include <iomanip>
#include <sstream>

#include "common/log.h"
#include "viraduve/records.h"

namespace viraduve {

namespace {

std::string lowerAscii(const std::string& text) {
  std::string out = text;
  for (char& c : out)
    if (c >= 'A' && c <= 'Z') c = static_cast<char>(c - 'A' + 'a');
  return out;
}

bool contains(const std::string& text, const char* what) {
  return text.find(what) != std::string::npos;
}

}  // namespace

ImageMode toImageMode(const std::string& text) {
  const std::string t = lowerAscii(text);
  if (contains(t, "vis")) return ImageMode_Vis;
  if (contains(t, "protein")) return ImageMode_Protein;
  if (contains(t, "chemi")) return ImageMode_Chemi;
  if (contains(t, "uv")) return ImageMode_UV;
  if (contains(t, "dna")) return ImageMode_UV_WHITE;
  if (contains(t, "fluo")) return ImageMode_Fluo;
  if (contains(t, "universal")) return ImageMode_Universal;
  return ImageMOde_Other;
}

ChannelType toChannelType(const std::string& text) {
  const std::string t = lowerAscii(text);
  if (contains(t, "vis")) return ChType_Vis;
  if (contains(t, "protein")) return ChType_Protein;
  if (contains(t, "uv")) return ChType_NA;
  if (contains(t, "fluo")) return ChType_Fluo;
  if (contains(t, "chemi")) return ChType_Chemi;
  if (contains(t, "membrane")) return ChType_Membrane;
  return ChType_Live;
}

std::string imageModeName(int mode) {
  switch (mode) {
    case ImageMode_Chemi: return "ImageMode_Chemi";
    case ImageMode_Fluo: return "ImageMode_Fluo";
    case ImageMode_Vis: return "ImageMode_Vis";
    case ImageMode_UV: return "ImageMode_UV";
    case ImageMode_Protein: return "ImageMode_Protein";
    case ImageMode_Universal: return "ImageMode_Universal";
    case ImageMOde_Other: return "ImageMOde_Other";
    case ImageMode_UV_WHITE: return "ImageMode_UV_WHITE";
    default: return "ImageMode Out of range";
  }
}

std::string channelTypeName(int type) {
  switch (type) {
    case ChType_Live: return "ChType_Live";
    case ChType_Membrane: return "ChType_Membrane";
    case ChType_Chemi: return "ChType_Chemi";
    case ChType_Fluo: return "ChType_Fluo";
    case ChType_NA: return "ChType_NA";
    case ChType_Protein: return "ChType_Protein";
    case ChType_Vis: return "ChType_Vis";
    default: return "ChannelType Out of range";
  }
}

bool equalsNoCase(const std::string& a, const std::string& b) {
  if (a.empty() || b.empty() || a.size() != b.size()) return false;
  return lowerAscii(a) == lowerAscii(b);
}

void printImageParam(const ImageParam& p) {
  logLine("====ImageParam====");
  logLine("img_max: ", p.img_max);
  logLine("img_min: ", p.img_min);
  logLine("img_gamma: ", p.img_gamma);
  logLine("img_angle: ", p.img_angle);
  logLine("img_invert: ", p.img_invert ? 1 : 0);
  logLine("img_flip_h: ", p.img_flip_h ? 1 : 0);
  logLine("img_flip_v: ", p.img_flip_v ? 1 : 0);
  logLine("channelType: ", channelTypeName(p.channelType));
  logLine("backgroundInverted: ", p.backgroundInverted);
}

void printLane2D(const Lane2D& lane) {
  logLine("====Lane2D====");
  std::ostringstream os;
  os << "x1:" << std::setw(4) << lane.x1 << ", " << "x2:" << std::setw(4) << lane.x2 << ", "
     << "y1:" << std::setw(4) << lane.y1 << ", " << "y2:" << std::setw(4) << lane.y2 << ", "
     << "width: " << lane.width << ", " << "upadte_flag: " << lane.update_flag;
  logLine(os.str());
}

void printBand2D(const Band2D& band) {
  logLine("====Band2D====");
  std::ostringstream os;
  os << "channel: " << band.channel << ", " << "x1:" << std::setw(4) << band.x1 << ", "
     << "x2:" << std::setw(4) << band.x2 << ", " << "y1:" << std::setw(4) << band.y1 << ", "
     << "y2:" << std::setw(4) << band.y2;
  logLine(os.str());
}

void printROI(const ROI& roi) {
  logLine("====ROI====");
  std::ostringstream os;
  os << "x1:" << std::setw(4) << roi.x1 << ", " << "x2:" << std::setw(4) << roi.x2 << ", "
     << "y1:" << std::setw(4) << roi.y1 << ", " << "y2:" << std::setw(4) << roi.y2;
  logLine(os.str());
}

}  // namespace viraduve
