// Drawing of the analysis overlays on an exported picture (8UC3, blue-green-red, already
// scaled to output pixels), and the margin routines that make room for labels outside it.
#pragma once

#include <string>
#include <vector>

#include <opencv2/core.hpp>

#include "export/export_documents.h"
#include "viraduve/records.h"

namespace viraduve {
namespace Export {

// White margins around the picture, in unscaled pixels.
struct Offset {
  int left = 0;
  int right = 0;
  int top = 0;
  int bottom = 0;
};

// Output pixels per unscaled pixel.
struct ScalePair {
  double x = 1.0;
  double y = 1.0;
};

// (trunc(5 sx) + text width, trunc(5 sy) + text height) of a frame name; logs the values.
cv::Point frameNumberOffset(const std::string& name, ScalePair scale, double fontScale,
                            int thickness);

// Widens offset so that the frame names fit above and left of the frames, keeping the
// aspect ratio of the unscaled picture.
void calculateFrameNameOffset(Offset& offset, const std::vector<CloudFrame>& frames,
                              ScalePair scale, cv::Size unscaled, double fontScale,
                              int thickness);

// Widens offset so that the annotations of the exported channels reaching outside the
// unscaled picture fit, with 2 pixels to spare.
void calculateAnnotationOffset(Offset& offset, const std::vector<ChannelAnnotations>& annotations,
                               const std::vector<int>& pictureChannels, cv::Size unscaled);

// Widens the left margin so that the marker labels fit; scale is the provisional scale for a
// picture without margins.
void calculateMarkerOffset(Offset& offset, const std::vector<MarkerWeightMap>& markers,
                           ScalePair scale, cv::Size unscaled, double fontScale, int thickness);

// Frames with their names, lanes with their numbers and kinds, bands with their labels.
void drawLaneBands(cv::Mat& picture, const std::vector<CloudFrame>& frames,
                   const std::vector<std::vector<CloudLane>>& lanesPerFrame,
                   const std::vector<TpnExportFrame>& normalisation, ScalePair scale,
                   double fontScale, int fontThickness, int shapeThickness);

// The regions of the picture's channel; thickness serves the label and the outline.
void drawRegions(cv::Mat& picture, const std::vector<CloudRegion>& regions, int channel,
                 double fontScale, int thickness);

// 45 below scaleX 0.56, 30 strictly between 0.56 and 1.1, 11 otherwise.
int markerLabelSize(double scaleX);
// |w| as an integer when it has no fraction, else with at most three decimals.
std::string markerWeightText(float weight);
void drawMarkers(cv::Mat& picture, const std::vector<MarkerWeightMap>& markers, ScalePair scale,
                 int labelSize, double fontScale, int fontThickness, int shapeThickness);

// Narrows fontScale so that the widest text line fits the annotation's box.
void textAnnotationSizeForBox(const Annotation& annotation, double& fontScale, int thickness);
// The annotations whose channel is the picture's channel (-1 for the merged picture).
void drawAnnotations(cv::Mat& picture, const std::vector<ChannelAnnotations>& annotations,
                     int channel, double scaleY, int shapeThickness);

}  // namespace Export
}  // namespace viraduve
