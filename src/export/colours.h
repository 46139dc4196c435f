// Drawing colours of the export: the colour table behind colour texts, the fixed overlay
// colours, and the dark / light test that picks the region colours.
#pragma once

#include <string>

#include <opencv2/core.hpp>

namespace viraduve {
namespace Export {

// Scalar (blue, green, red) of a "#RRGGBB" text in the colour table, compared exactly (upper
// case); "#000000" gives (13, 13, 13); any other text the colour of "#FABF08".
cv::Scalar hexToScalar(const std::string& colourText);

// True when dark pixels (grey <= 128) outnumber bright ones by more than a tenth of all pixels.
bool isDarkPicture(const cv::Mat& picture);

namespace colours {
constexpr const char* kFrame = "#18FFFF";
constexpr const char* kLane = "#25E4A4";
constexpr const char* kReferenceLane = "#FF0059";
constexpr const char* kExcludedLane = "#5C6B75";
constexpr const char* kBand = "#25E4A4";
constexpr const char* kMarker = "#E408B5";
constexpr const char* kRegionDarkOutline = "#FABF08";
constexpr const char* kRegionDarkLabel = "#1DE9B6";
constexpr const char* kRegionLightOutline = "#3742FA";
constexpr const char* kRegionLightLabel = "#FF0059";
}  // namespace colours

}  // namespace Export
}  // namespace viraduve
