// Every request decoder on arbitrary text: it must parse or refuse, never crash.
#include <cstddef>
#include <cstdint>
#include <exception>
#include <string>
#include <vector>

#include "api/call_frame.h"
#include "api/request_decoding.h"
#include "api/tpn_request.h"

using namespace viraduve;

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  const std::string text(reinterpret_cast<const char*>(data), size);
  Json::Value root;
  if (!api::parseJson(text, root, "fuzz")) return 0;
  try {
    std::vector<CloudImageParam> cloudParams;
    std::vector<ImageParam> params;
    api::decodeImageParas(root["ImageParas"], cloudParams, params);
  } catch (const std::exception&) {
  }
  std::vector<ROI> rois;
  std::vector<std::vector<Lane2D>> lanes;
  std::vector<CloudFrame> frames;
  std::vector<std::vector<CloudLane>> cloudLanes;
  try {
    api::decodeFrame(root["analysisFrame"], rois, lanes, frames, cloudLanes);
  } catch (const std::exception&) {
  }
  try {
    api::decodeFrameOnly(root["analysisFrame"], rois, frames);
  } catch (const std::exception&) {
  }
  try {
    api::decodeFrameList(root, rois, lanes, frames, cloudLanes);
  } catch (const std::exception&) {
  }
  try {
    api::decodeTpnFrameList(root["frameList"]);
  } catch (const std::exception&) {
  }
  try {
    std::vector<Region2D> regions;
    std::vector<CloudRegion> cloudRegions;
    api::decodeRegions(root["region_list"], regions, cloudRegions);
  } catch (const std::exception&) {
  }
  try {
    api::decodeMarkerWeights(root["mwMarkerFrame"], frames, cloudLanes);
  } catch (const std::exception&) {
  }
  return 0;
}
