// getTPNAnalysisData: total-protein normalisation of the lanes the host selects. Unlike the
// other analysis calls, every refusal (unknown mode, a text that does not parse) is raised,
// so the host always gets "error" rather than a null answer.
#include <exception>

#include "api/call_frame.h"
#include "api/flows.h"
#include "api/request_decoding.h"
#include "api/response_encoding.h"
#include "api/tpn_request.h"
#include "common/checked.h"
#include "common/log.h"
#include "model/conversion.h"
#include "pipeline/ImageProcessing.h"

namespace viraduve {
namespace api {

namespace {

TpnRect readRect(const Json::Value& v) {
  TpnRect r;
  r.x1 = v["x1"].asUInt();
  r.x2 = v["x2"].asUInt();
  r.y1 = v["y1"].asUInt();
  r.y2 = v["y2"].asUInt();
  return r;
}

bool sameRect(const TpnRect& r, int32_t x1, int32_t y1, int32_t x2, int32_t y2) {
  return r.x1 == static_cast<uint32_t>(x1) && r.y1 == static_cast<uint32_t>(y1) &&
         r.x2 == static_cast<uint32_t>(x2) && r.y2 == static_cast<uint32_t>(y2);
}

bool sameLane(const CloudLane& c, const Lane2D& l) {
  return c.x1 == static_cast<uint32_t>(l.x1) && c.y1 == static_cast<uint32_t>(l.y1) &&
         c.x2 == static_cast<uint32_t>(l.x2) && c.y2 == static_cast<uint32_t>(l.y2);
}

// A refusal: a standard exception without message.
[[noreturn]] void refuse() { throw std::exception(); }

}  // namespace

std::vector<TpnFrame> decodeTpnFrameList(const Json::Value& frameList) {
  std::vector<TpnFrame> frames;
  for (Json::ArrayIndex i = 0; i < frameList.size(); ++i) {
    const Json::Value& f = frameList[i];
    TpnFrame frame;
    frame.analysisFrameRoi = readRect(f["analysisFrameRoi"]);
    frame.uid = f["uid"].asString();
    frame.channel = f["channel"].asUInt();
    const Json::Value& lanes = f["normalizeLanes"];
    frame.verticalRange[0] = lanes[0u]["laneVolTop"]["y1"].asUInt();
    frame.verticalRange[1] = lanes[0u]["laneVolBottom"]["y2"].asUInt();
    for (Json::ArrayIndex j = 0; j < lanes.size(); ++j) {
      TpnLane lane;
      lane.uid = lanes[j]["uid"].asString();
      lane.laneRoi = readRect(lanes[j]["laneRoi"]);
      frame.normalizeLanes.push_back(lane);
    }
    frames.push_back(frame);
  }
  return frames;
}

std::vector<std::vector<Lane2D>> buildWorkingFrames(const std::vector<ROI>& rois,
                                                    const std::vector<std::vector<Lane2D>>& lanes2d,
                                                    const std::vector<TpnFrame>& requestFrames) {
  std::vector<std::vector<Lane2D>> working(requestFrames.size());
  for (std::size_t a = 0; a < rois.size(); ++a) {
    const ROI& roi = rois[a];
    for (std::size_t f = 0; f < requestFrames.size(); ++f) {
      const TpnFrame& request = requestFrames[f];
      if (!sameRect(request.analysisFrameRoi, roi.x1, roi.y1, roi.x2, roi.y2)) continue;
      for (const Lane2D& lane : at(lanes2d, a)) {
        for (const TpnLane& named : request.normalizeLanes) {
          if (sameRect(named.laneRoi, lane.x1, lane.y1, lane.x2, lane.y2)) {
            working[f].push_back(lane);
          }
        }
      }
    }
  }
  return working;
}

void mergeTpnResults(const std::vector<TpnFrameResult>& results,
                     std::vector<std::vector<CloudLane>>& cloudLanes) {
  for (const TpnFrameResult& result : results) {
    for (std::size_t j = 0; j < result.lanes.size(); ++j) {
      const Lane2D& lane = result.lanes[j];
      for (std::vector<CloudLane>& frameLanes : cloudLanes) {
        for (CloudLane& cloud : frameLanes) {
          if (!sameLane(cloud, lane)) continue;
          cloud.norm_factor = at(result.normFactor, j);
          cloud.lane_volume = at(result.laneVolume, j);
          cloud.lane_background_volume = at(result.laneBackgroundVolume, j);
          cloud.lane_adjusted_volume = at(result.laneAdjustedVolume, j);
          std::vector<CloudBand> bands(lane.bands.size());
          for (std::size_t k = 0; k < bands.size(); ++k) {
            if (k < cloud.bands.size()) bands[k] = cloud.bands[k];
            mergeBand(lane.bands[k], bands[k]);
          }
          cloud.bands = std::move(bands);
        }
      }
    }
  }
}

char* tpnAnalysisFlow(const char* imageDir, const char* analysisFrames, const char* mode,
                      const char* tpnRequest, const char* imageParas) {
  return guardTextCall("getTPNAnalysisData", [&]() -> char* {
    const std::string dir = textArg(imageDir);
    const ImageMode imgMode = toImageMode(textArg(mode));
    if (imgMode == ImageMOde_Other) refuse();

    Json::Value parasRoot;
    if (!parseJson(textArg(imageParas), parasRoot, "Failed to parse image params")) refuse();
    std::vector<CloudImageParam> cloudParams;
    std::vector<ImageParam> params;
    decodeImageParas(parasRoot["ImageParas"], cloudParams, params);

    // One {"analysisFrame": ...} object, or an array of them.
    Json::Value framesRoot;
    if (!parseJson(textArg(analysisFrames), framesRoot, "Failed to parse analysis Frame")) refuse();
    std::vector<ROI> rois;
    std::vector<std::vector<Lane2D>> lanes2d;
    std::vector<CloudFrame> cloudFrames;
    std::vector<std::vector<CloudLane>> cloudLanes;
    if (framesRoot.isArray()) {
      decodeFrameList(framesRoot, rois, lanes2d, cloudFrames, cloudLanes);
    } else {
      decodeFrame(framesRoot["analysisFrame"], rois, lanes2d, cloudFrames, cloudLanes);
    }

    Json::Value tpnRoot;
    if (!parseJson(textArg(tpnRequest), tpnRoot, "Failed to parse request object from ui")) {
      refuse();
    }
    const std::vector<TpnFrame> requestFrames = decodeTpnFrameList(tpnRoot["frameList"]);
    logLine("Done processing jTPNFrameArray");

    applyChannelGeometry(dir, params);

    const std::vector<std::vector<Lane2D>> working = buildWorkingFrames(rois, lanes2d, requestFrames);
    logLine("temp analysis object created");

    std::vector<TpnFrameResult> results;
    for (std::size_t f = 0; f < requestFrames.size(); ++f) {
      logLine("before calling tpn size of imageparam", params.size());
      const CloudImageParam& first = at(cloudParams, 0);
      ImageProcessing::LanesPerFrame lanes{working[f]};
      std::vector<std::vector<double>> normFactor;
      std::vector<std::vector<double>> laneVolume;
      std::vector<std::vector<double>> laneBackgroundVolume;
      std::vector<std::vector<double>> laneAdjustedVolume;
      ImageProcessing::computeAllNormFactor(
          dir, imgMode, params, static_cast<int>(requestFrames[f].channel),
          {requestFrames[f].verticalRange}, lanes, normFactor, laneVolume, laneBackgroundVolume,
          laneAdjustedVolume, first.digitalZoom, first.opticalZoom,
          static_cast<uint32_t>(first.binning));
      ImageProcessing::applyNormalization(lanes, normFactor);
      TpnFrameResult result;
      result.lanes = lanes.at(0);
      result.normFactor = at(normFactor, 0);
      result.laneVolume = at(laneVolume, 0);
      result.laneBackgroundVolume = at(laneBackgroundVolume, 0);
      result.laneAdjustedVolume = at(laneAdjustedVolume, 0);
      results.push_back(std::move(result));
    }

    mergeTpnResults(results, cloudLanes);
    logLine("temp analysis is updated with lane data");
    logLine("detected band is updated with temp data");
    return answerText(encodeFrames(buildFrameLanes(cloudFrames, cloudLanes)));
  });
}

}  // namespace api
}  // namespace viraduve
