// Rendering of one channel for display: contrast window and gamma, colour tint, merging of
// channels, and the three display aids of the export (saturation marking, automatic contrast
// window, the fluorescence background flattening). docs/export.md describes the aids.
#pragma once

#include <opencv2/core.hpp>

#include "viraduve/records.h"

namespace viraduve {
namespace Export {

// -1 for a channel shown on a black background ("black"), 1 otherwise.
int backgroundFlag(const CloudImageParam& p);

// 16UC1 -> 16UC1: (v/65535 - min/65535) / ((max - min)/65535), clamped to 0..1, ^gamma, x65535.
cv::Mat displayMapping(const cv::Mat& channel16, const CloudImageParam& p);

// True when the channel is shown in grey instead of its colour.
bool keepsGreyRendering(const CloudImageParam& p, ImageMode mode, int backgroundFlag);

// Tints a grey 8UC3 picture with the colour (r, g, b) through HSV; 8UC3 result.
cv::Mat tintChannel(const cv::Mat& grey8c3, int r, int g, int b, int backgroundFlag);

// Blends next into merged (both 8UC3) per component: multiply a*c, or screen 1-(1-a)(1-c),
// on values scaled to 0..1, truncated back to 0..255.
void blendChannel(cv::Mat& merged8c3, const cv::Mat& next8c3, bool multiply);

// The samples at the sensor's limit in the channel as given (inverted when p.img_invert):
// 255 where saturated, 0 elsewhere (8UC1).
cv::Mat saturationMask(const cv::Mat& channel16, const CloudImageParam& p, ImageMode mode,
                       int channel);

// Paints the masked pixels of the rendered channel (16UC1 or 16UC3) in the marking colour;
// the result is 16UC3.
cv::Mat markSaturation(const cv::Mat& rendered16, const cv::Mat& mask, const CloudImageParam& p,
                       ImageMode mode, int channel);

// Sets p.img_min / p.img_max to the 0.1 % / 99.9 % percentiles of the channel's samples.
void autoContrastWindow(const cv::Mat& channel16, CloudImageParam& p, ImageMode mode,
                        int channel);

// Flattens a slowly varying background of a fluorescence channel (bright signal on dark).
cv::Mat channelStep(const cv::Mat& channel16, const CloudImageParam& p, ImageMode mode,
                    int channel);

}  // namespace Export
}  // namespace viraduve
