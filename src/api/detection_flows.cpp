// The four entry points that detect and quantify lanes and bands: automatic analysis, band
// analysis of given lanes, detection inside a given frame and band update in edited lanes.
// All documents are parsed before anything is decoded, and everything is decoded before the
// channel files are straightened, so a refused or malformed request leaves the capture as it is.
#include <string>
#include <vector>

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

const char kImageParamsFailure[] = "Failed to parse image params";
const char kFrameFailure[] = "Failed to parse analysis Frame";

// The results of one request on their way to the answer.
struct Analysis {
  std::vector<ROI> rois;
  std::vector<std::vector<Lane2D>> lanes2d;
  std::vector<CloudFrame> cloudFrames;
  std::vector<std::vector<CloudLane>> cloudLanes;
};

void decodeParams(const Json::Value& root, std::vector<ImageParam>& params) {
  std::vector<CloudImageParam> cloudParams;
  decodeImageParas(root["ImageParas"], cloudParams, params);
}

// The rolling-ball measures belong to their own request; these answers carry none.
void clearRollingMeasures(std::vector<std::vector<Lane2D>>& lanesPerFrame) {
  for (std::vector<Lane2D>& lanes : lanesPerFrame) {
    for (Lane2D& lane : lanes) {
      for (Band2D& band : lane.bands) {
        band.rolling_bg_volume = 0.0;
        band.rolling_bg_density = 0.0;
      }
    }
  }
}

char* answerFrames(Analysis& a) {
  clearRollingMeasures(a.lanes2d);
  instrument2cloudAnalysisObject(a.cloudFrames, a.cloudLanes, a.rois, a.lanes2d);
  return answerText(encodeFrames(buildFrameLanes(a.cloudFrames, a.cloudLanes)));
}

}  // namespace

char* autoAnalysisFlow(const char* imageDir, const char* mode, const char* imageParas) {
  return guardTextCall("getAutoAnalysisFrameDetection", [&]() -> char* {
    const std::string dir = textArg(imageDir);
    const std::string modeText = textArg(mode);
    logLine("in getAutoAnalysisFrameDetection:: url = ", dir);
    const ImageMode imageMode = toImageMode(modeText);
    if (imageMode == ImageMOde_Other) return nullptr;
    logLine("Calling auto analysis");
    logLine("mode: ", modeText);

    Json::Value paramsRoot;
    if (!parseJson(textArg(imageParas), paramsRoot, kImageParamsFailure)) return nullptr;
    std::vector<ImageParam> params;
    decodeParams(paramsRoot, params);
    applyChannelGeometry(dir, params);

    // The request carries no frames: every frame, lane and band of the answer is new.
    Analysis a;
    ImageProcessing::runAnalysisFrameDetection(dir, a.rois, params, imageMode);
    logLine("runAnalysisFrameDetection over");
    ImageProcessing::runBandLandeDetection(dir, a.lanes2d, a.rois, params, imageMode);
    logLine("runBandLandeDetection over");
    ImageProcessing::runBandLandeAnalysis(dir, a.lanes2d, params, imageMode);
    logLine("runBandLandeAnalysis over");
    logLine("auto analysis is done by ImageProcessing layer");
    return answerFrames(a);
  });
}

char* bandLaneAnalysisFlow(const char* imageDir, const char* analysisFrame, const char* mode,
                           const char* imageParas) {
  return guardTextCall("getBandLaneAnalysis", [&]() -> char* {
    const std::string dir = textArg(imageDir);
    const std::string modeText = textArg(mode);
    logLine("in getBandLaneAnalysis:: url = ", dir);
    const ImageMode imageMode = toImageMode(modeText);

    Json::Value paramsRoot;
    if (!parseJson(textArg(imageParas), paramsRoot, kImageParamsFailure)) return nullptr;
    Json::Value frameRoot;
    if (!parseJson(textArg(analysisFrame), frameRoot, kFrameFailure)) return nullptr;
    std::vector<ImageParam> params;
    decodeParams(paramsRoot, params);
    Analysis a;
    const Json::Value& frames = frameRoot;
    decodeFrame(frames["analysisFrame"], a.rois, a.lanes2d, a.cloudFrames, a.cloudLanes);
    applyChannelGeometry(dir, params);

    ImageProcessing::runBandLandeAnalysis(dir, a.lanes2d, params, imageMode);
    return answerFrames(a);
  });
}

char* customAnalysisFrameFlow(const char* imageDir, const char* analysisFrame, const char* mode,
                              const char* imageParas) {
  return guardTextCall("getCustomAnalysisFrame", [&]() -> char* {
    const std::string dir = textArg(imageDir);
    const std::string modeText = textArg(mode);
    logLine("in getCustomAnalysisFrame:: url = ", dir);
    const ImageMode imageMode = toImageMode(modeText);
    if (imageMode == ImageMOde_Other) return nullptr;

    Json::Value frameRoot;
    if (!parseJson(textArg(analysisFrame), frameRoot, kFrameFailure)) return nullptr;
    Json::Value paramsRoot;
    if (!parseJson(textArg(imageParas), paramsRoot, kImageParamsFailure)) return nullptr;
    // Only the frame is taken from the request; its lanes are found anew.
    Analysis a;
    const Json::Value& frames = frameRoot;
    decodeFrameOnly(frames["analysisFrame"], a.rois, a.cloudFrames);
    std::vector<ImageParam> params;
    decodeParams(paramsRoot, params);
    applyChannelGeometry(dir, params);

    ImageProcessing::runBandLandeDetection(dir, a.lanes2d, a.rois, params, imageMode);
    ImageProcessing::runBandLandeAnalysis(dir, a.lanes2d, params, imageMode);
    return answerFrames(a);
  });
}

char* updateBandDetectionFlow(const char* imageDir, const char* analysisFrame, const char* mode,
                              const char* imageParas) {
  return guardTextCall("getUpdateBandDetection", [&]() -> char* {
    const std::string dir = textArg(imageDir);
    const std::string modeText = textArg(mode);
    logLine("in getUpdateBandDetection:: url = ", dir);
    const ImageMode imageMode = toImageMode(modeText);

    Json::Value frameRoot;
    if (!parseJson(textArg(analysisFrame), frameRoot, kFrameFailure)) return nullptr;
    Json::Value paramsRoot;
    if (!parseJson(textArg(imageParas), paramsRoot, kImageParamsFailure)) return nullptr;
    Analysis a;
    const Json::Value& frames = frameRoot;
    decodeFrame(frames["analysisFrame"], a.rois, a.lanes2d, a.cloudFrames, a.cloudLanes);
    std::vector<ImageParam> params;
    decodeParams(paramsRoot, params);
    applyChannelGeometry(dir, params);

    ImageProcessing::updateBandDetection(dir, a.lanes2d, params, imageMode);
    ImageProcessing::runBandLandeAnalysis(dir, a.lanes2d, params, imageMode);
    return answerFrames(a);
  });
}

}  // namespace api
}  // namespace viraduve
