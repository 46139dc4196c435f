// getRollingBallOnAnalysedData: re-measures the bands of an analysed frame with a rolling-ball
// lane background whose radius the host sets per channel ("rollingBall").
#include "api/call_frame.h"
#include "api/flows.h"
#include "api/request_decoding.h"
#include "api/response_encoding.h"
#include "common/log.h"
#include "model/conversion.h"
#include "pipeline/CloudAnalysis.h"

namespace viraduve {
namespace api {

char* rollingBallFlow(const char* imageDir, const char* analysisFrame, const char* mode,
                      const char* imageParas) {
  return guardTextCall("getRollingBallOnAnalysedData", [&]() -> char* {
    const std::string dir = textArg(imageDir);
    const ImageMode imgMode = toImageMode(textArg(mode));

    Json::Value parasRoot;
    if (!parseJson(textArg(imageParas), parasRoot, "Failed to parse image params")) return nullptr;
    std::vector<CloudImageParam> cloudParams;
    std::vector<ImageParam> params;
    decodeImageParas(parasRoot["ImageParas"], cloudParams, params);

    Json::Value frameRoot;
    if (!parseJson(textArg(analysisFrame), frameRoot, "Failed to parse analysis Frame")) {
      return nullptr;
    }
    const Json::Value& frame = frameRoot["analysisFrame"];
    std::vector<ROI> rois;
    std::vector<std::vector<Lane2D>> lanes2d;
    std::vector<CloudFrame> cloudFrames;
    std::vector<std::vector<CloudLane>> cloudLanes;
    decodeFrame(frame, rois, lanes2d, cloudFrames, cloudLanes);
    std::vector<CloudAnalysis::RollingBallSetting> settings;
    const Json::Value& rollingBall = frame["rollingBall"];
    for (Json::ArrayIndex i = 0; i < rollingBall.size(); ++i) {
      CloudAnalysis::RollingBallSetting s;
      s.channel = rollingBall[i]["channel"].asUInt();
      s.radius = rollingBall[i]["radius"].asUInt();
      settings.push_back(s);
    }

    applyChannelGeometry(dir, params);
    logLine("url for rollingball call: ", dir);
    for (const ROI& roi : rois) {
      CloudAnalysis::runRollingBallAnalysis(dir, lanes2d, params, imgMode, roi, settings);
    }
    instrument2cloudAnalysisObject(cloudFrames, cloudLanes, rois, lanes2d);
    return answerText(encodeFrames(buildFrameLanes(cloudFrames, cloudLanes)));
  });
}

}  // namespace api
}  // namespace viraduve
