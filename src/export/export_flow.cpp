// convertAndExportImage: parses the export request, runs the export and answers a status.
#include <string>
#include <vector>

#include "api/call_frame.h"
#include "api/flows.h"
#include "api/request_decoding.h"
#include "common/log.h"
#include "export/export_documents.h"
#include "export/export_driver.h"

namespace viraduve {
namespace api {

// The platform name only chose a path separator on the host's own system; paths are always
// joined with "/" here (see Export::outputFolder), so it is not read.
int exportFlow(const char* imageDir, const char* frames, const char* regions, const char* mode,
               const char* exportAttribute, const char* imageParas, const char* overlayList,
               const char* annotations, int channelStep, const char* tpnFrames,
               const char* markers, const char* textList, const char* /*platform*/) {
  return guardStatusCall("convertAndExportImage", -1, [&]() -> int {
    const std::string dir = textArg(imageDir);
    const ImageMode imageMode = toImageMode(textArg(mode));
    Json::Value root;
    const Json::Value& doc = root;

    if (!parseJson(textArg(exportAttribute), root, "Failed to parse export Attribute Params")) return -1;
    const Export::ExportAttributes attributes = Export::decodeExportAttributes(doc["exportAttribute"]);

    // With annotations wanted, a broken annotation or overlay document answers 0, which the
    // host reads as "nothing exported"; every other broken document answers -1.
    std::vector<Export::ChannelAnnotations> notes;
    if (attributes.exportAnnotation) {
      if (!parseJson(textArg(annotations), root, "Failed to parse annotationAttribute")) return 0;
      notes = Export::decodeAnnotations(doc["annotationAttribute"]);
      if (!parseJson(textArg(overlayList), root, "Failed to parse overlayList")) return 0;
    } else if (!parseJson(textArg(overlayList), root, "Failed to parse overlayList")) {
      return -1;
    }
    const std::vector<uint32_t> overlay = Export::decodeOverlayList(doc["overlayList"]);

    if (!parseJson(textArg(frames), root, "Failed to parse analysis Frame")) return -1;
    std::vector<ROI> rois;
    std::vector<std::vector<Lane2D>> lanes2d;
    std::vector<CloudFrame> cloudFrames;
    std::vector<std::vector<CloudLane>> cloudLanes;
    decodeFrameList(doc, rois, lanes2d, cloudFrames, cloudLanes);

    if (!parseJson(textArg(regions), root, "Failed to parse RegionList")) return -1;
    std::vector<Region2D> regions2d;
    std::vector<CloudRegion> cloudRegions;
    decodeRegions(doc["region_list"], regions2d, cloudRegions);

    if (!parseJson(textArg(imageParas), root, "Failed to parse image params")) return -1;
    std::vector<CloudImageParam> cloudParams;
    std::vector<ImageParam> params;
    decodeImageParas(doc["ImageParas"], cloudParams, params);

    if (!parseJson(textArg(tpnFrames), root, "Failed to parse tpnFrameList")) return -1;
    std::vector<Export::TpnExportFrame> normalisation = Export::decodeTpnExportFrames(doc);

    if (!parseJson(textArg(markers), root, "Failed to parse marker Weights")) return -1;
    std::vector<MarkerWeightMap> weights = decodeMarkerWeights(doc["mwMarkerFrame"], cloudFrames, cloudLanes);

    // The text list is checked and read like the others, though nothing uses its texts.
    if (!parseJson(textArg(textList), root, "Failed to parse overlayList")) return -1;
    Export::decodeTextList(doc);

    std::string result;
    std::vector<std::string> pictureNames;
    Export::runImageExport(result, dir, dir, std::move(cloudLanes), std::move(cloudFrames),
                           std::move(cloudParams), attributes, imageMode, std::move(cloudRegions),
                           channelStep, overlay, std::move(notes), std::move(normalisation),
                           std::move(weights), pictureNames);
    logLine("Image export algorithm completed!");
    return 0;
  });
}

}  // namespace api
}  // namespace viraduve
