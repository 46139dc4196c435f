// Placeholder until the request/response layer lands; deleted by its implementation.
#include <stdexcept>
#include "api/call_frame.h"
#include "api/flows.h"
#include "api/request_decoding.h"
#include "api/response_encoding.h"
#include "model/conversion.h"
namespace viraduve {
namespace api {
const char kErrorAnswer[] = "error";
[[noreturn]] static void pending() { throw std::logic_error("not implemented yet"); }
std::string textArg(const char* t) { return t ? t : ""; }
bool parseJson(const std::string&, Json::Value&, const char*) { pending(); }
char* answerText(const std::string&) { pending(); }
char* guardTextCall(const char*, const std::function<char*()>&) { pending(); }
int guardStatusCall(const char*, int, const std::function<int()>&) { pending(); }
void applyChannelGeometry(const std::string&, std::vector<ImageParam>&) { pending(); }
void decodeImageParas(const Json::Value&, std::vector<CloudImageParam>&, std::vector<ImageParam>&) { pending(); }
void decodeFrame(const Json::Value&, std::vector<ROI>&, std::vector<std::vector<Lane2D>>&, std::vector<CloudFrame>&, std::vector<std::vector<CloudLane>>&) { pending(); }
void decodeFrameOnly(const Json::Value&, std::vector<ROI>&, std::vector<CloudFrame>&) { pending(); }
void decodeFrameList(const Json::Value&, std::vector<ROI>&, std::vector<std::vector<Lane2D>>&, std::vector<CloudFrame>&, std::vector<std::vector<CloudLane>>&) { pending(); }
void decodeRegions(const Json::Value&, std::vector<Region2D>&, std::vector<CloudRegion>&) { pending(); }
std::vector<MarkerWeightMap> decodeMarkerWeights(const Json::Value&, const std::vector<CloudFrame>&, const std::vector<std::vector<CloudLane>>&) { pending(); }
std::string encodeFrames(const std::vector<CloudFrameLanes>&) { pending(); }
std::string encodeRegions(const std::vector<CloudRegion>&) { pending(); }
std::vector<CloudFrameLanes> buildFrameLanes(const std::vector<CloudFrame>&, const std::vector<std::vector<CloudLane>>&) { pending(); }
char* autoAnalysisFlow(const char*, const char*, const char*) { pending(); }
char* bandLaneAnalysisFlow(const char*, const char*, const char*, const char*) { pending(); }
char* customAnalysisFrameFlow(const char*, const char*, const char*, const char*) { pending(); }
char* updateBandDetectionFlow(const char*, const char*, const char*, const char*) { pending(); }
int vitToTiffFlow(const char*, const char*) { pending(); }
}  // namespace api
ImageParam toImageParam(const CloudImageParam&) { throw std::logic_error("pending"); }
ROI toROI(const CloudFrame&) { throw std::logic_error("pending"); }
Band2D toBand2D(const CloudBand&) { throw std::logic_error("pending"); }
Lane2D toLane2D(const CloudLane&) { throw std::logic_error("pending"); }
Region2D toRegion2D(const CloudRegion&) { throw std::logic_error("pending"); }
std::vector<Region2D> toRegion2DList(const std::vector<CloudRegion>&) { throw std::logic_error("pending"); }
void mergeBand(const Band2D&, CloudBand&) { throw std::logic_error("pending"); }
void mergeRegion(const Region2D&, CloudRegion&) { throw std::logic_error("pending"); }
void instrument2cloudAnalysisObject(std::vector<CloudFrame>&, std::vector<std::vector<CloudLane>>&, std::vector<ROI>, std::vector<std::vector<Lane2D>>) { throw std::logic_error("pending"); }
}  // namespace viraduve
