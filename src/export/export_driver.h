// The export worker: renders the channels of a capture for display, merges them, adds the
// label margins, scales to the print size, draws the overlays and writes the image files.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include <opencv2/core.hpp>

#include "export/export_documents.h"
#include "export/overlays.h"
#include "viraduve/records.h"

namespace viraduve {
namespace Export {

// Converts a CV_8UC1 / 8UC3 / 16UC1 / 16UC3 picture to depth 8 or 16 (x1/255, x255) and 1 or 3
// channels; other source types raise the -3 export error.
void imgConvertTo(const cv::Mat& src, cv::Mat& dst, int depth, int channels);

// Output size in pixels (not truncated) for a picture of rows x cols, keeping its aspect ratio
// within the requested print size.
struct TargetSize {
  double width = 0.0;
  double height = 0.0;
};
TargetSize targetSize(const ExportAttributes& attributes, int rows, int cols);

struct FontParameters {
  double fontScale = 0.43;
  int fontThickness = 1;
};
// Font scale and thickness for a target size; logs them.
FontParameters fontParameters(TargetSize target);
// Line thickness of shapes for a target size; logs it.
int shapeLineThickness(TargetSize target);

// "png", "jpg" or "tif" for the format code.
std::string fileExtension(uint32_t format);
// The folder the files are written to: imageDir/output/.
std::string outputFolder(const std::string& imageDir);

// The whole export; pictureNames receives the names of the channel pictures ("ch<i>") and
// of a merged picture ("overlay"). result is set to the empty text.
void runImageExport(std::string& result, const std::string& imageDir,
                    const std::string& outputDir,
                    std::vector<std::vector<CloudLane>> lanesPerFrame,
                    std::vector<CloudFrame> frames, std::vector<CloudImageParam> imageParams,
                    const ExportAttributes& attributes, ImageMode mode,
                    std::vector<CloudRegion> regions, int channelStepFlag,
                    const std::vector<uint32_t>& overlayList,
                    std::vector<ChannelAnnotations> annotations,
                    std::vector<TpnExportFrame> normalisation,
                    std::vector<MarkerWeightMap> markers,
                    std::vector<std::string>& pictureNames);

}  // namespace Export
}  // namespace viraduve
