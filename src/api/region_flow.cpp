// getRegionAnalysis: measures the user's rectangles and circles in every channel, with the
// global background from the host's background region, or the whole image when there is none.
#include "api/call_frame.h"
#include "api/flows.h"
#include "api/request_decoding.h"
#include "api/response_encoding.h"
#include "common/log.h"
#include "model/conversion.h"
#include "pipeline/ImageProcessing.h"

namespace viraduve {
namespace api {

namespace {

enum class Background { WholeImage, Rectangle, Circle };

}  // namespace

char* regionAnalysisFlow(const char* imageDir, const char* regions, const char* mode,
                         const char* imageParas, const char* bgRegion) {
  return guardTextCall("getRegionAnalysis", [&]() -> char* {
    const std::string dir = textArg(imageDir);
    const ImageMode imgMode = toImageMode(textArg(mode));

    Json::Value parasRoot;
    if (!parseJson(textArg(imageParas), parasRoot, "Failed to parse image params")) return nullptr;
    std::vector<CloudImageParam> cloudParams;
    std::vector<ImageParam> params;
    decodeImageParas(parasRoot["ImageParas"], cloudParams, params);

    Json::Value regionRoot;
    if (!parseJson(textArg(regions), regionRoot, "Failed to parse RegionList")) return nullptr;
    std::vector<Region2D> regions2d;
    std::vector<CloudRegion> cloudRegions;
    decodeRegions(regionRoot["region_list"], regions2d, cloudRegions);

    Background kind = Background::WholeImage;
    ROI rect;
    Circle circle;
    if (bgRegion != nullptr) {
      Json::Value bgRoot;
      if (!parseJson(bgRegion, bgRoot, "Failed to parse Global BG Region ")) return nullptr;
      const Json::Value& bg = bgRoot["bgRegion"];
      if (!bg["circle_b"].asBool()) {
        kind = Background::Rectangle;
        rect.x1 = static_cast<int32_t>(bg["x1"].asUInt());
        rect.y1 = static_cast<int32_t>(bg["y1"].asUInt());
        rect.x2 = static_cast<int32_t>(bg["x2"].asUInt());
        rect.y2 = static_cast<int32_t>(bg["y2"].asUInt());
      } else {
        kind = Background::Circle;
        circle.x = static_cast<int32_t>(bg["x"].asUInt());
        circle.y = static_cast<int32_t>(bg["y"].asUInt());
        circle.radius = static_cast<int32_t>(bg["circle_radius"].asUInt());
      }
    }

    applyChannelGeometry(dir, params);
    switch (kind) {
      case Background::Rectangle:
        logLine("::::::Rectangle Background Region Called ::::");
        ImageProcessing::runRegionAnalysisRectBackground(dir, regions2d, params, imgMode, rect);
        break;
      case Background::Circle:
        logLine("::::::Circle BackGround Region Called ::::");
        ImageProcessing::runRegionAnalysisCircleBackground(dir, regions2d, params, imgMode, circle);
        break;
      case Background::WholeImage:
        logLine("::::::No BackGround Region set ::::");
        ImageProcessing::runRegionAnalysis(dir, regions2d, params, imgMode);
        break;
    }

    for (std::size_t i = 0; i < regions2d.size() && i < cloudRegions.size(); ++i) {
      mergeRegion(regions2d[i], cloudRegions[i]);
    }
    return answerText(encodeRegions(cloudRegions));
  });
}

}  // namespace api
}  // namespace viraduve
