// Placeholder until normalisation, rolling ball and regions land; deleted by their implementation.
#include <stdexcept>
#include "api/flows.h"
#include "detector/BandLaneDetectionImpl.h"
#include "pipeline/CloudAnalysis.h"
#include "pipeline/ImageProcessing.h"
namespace viraduve {
[[noreturn]] static void pending() { throw std::logic_error("not implemented yet"); }
void BandLaneDetectionImpl::analyis(const Image&, std::vector<Region2D>&, uint32_t, const Circle&, int32_t) { pending(); }
void BandLaneDetectionImpl::analyis(const Image&, std::vector<Region2D>&, uint32_t, const ROI&, int32_t) { pending(); }
void BandLaneDetectionImpl::computeAllNormFactor(const Image&, const std::vector<VerticalRange>&, std::vector<std::vector<Lane2D>>&, int32_t, double, std::vector<std::vector<double>>&, std::vector<std::vector<double>>&, std::vector<std::vector<double>>&, std::vector<std::vector<double>>&) { pending(); }
namespace ImageProcessing {
void computeAllNormFactor(const std::string&, ImageMode, std::vector<ImageParam>, int, const std::vector<VerticalRange>&, LanesPerFrame&, std::vector<std::vector<double>>&, std::vector<std::vector<double>>&, std::vector<std::vector<double>>&, std::vector<std::vector<double>>&, double, double, uint32_t) { pending(); }
void applyNormalization(LanesPerFrame&, const std::vector<std::vector<double>>&) { pending(); }
void runRegionAnalysis(const std::string&, std::vector<Region2D>&, const std::vector<ImageParam>&, ImageMode) { pending(); }
void runRegionAnalysisRectBackground(const std::string&, std::vector<Region2D>&, const std::vector<ImageParam>&, ImageMode, const ROI&) { pending(); }
void runRegionAnalysisCircleBackground(const std::string&, std::vector<Region2D>&, const std::vector<ImageParam>&, ImageMode, const Circle&) { pending(); }
}  // namespace ImageProcessing
namespace CloudAnalysis {
void runRollingBallAnalysis(const std::string&, std::vector<std::vector<Lane2D>>&, const std::vector<ImageParam>&, ImageMode, const ROI&, const std::vector<RollingBallSetting>&) { pending(); }
void analyseLanesWithRollingBall(const Image&, std::vector<Lane2D>&, uint32_t, const ROI&, uint32_t) { pending(); }
std::vector<double> computeLaneProfile(const cv::Mat&, const Lane2D&) { pending(); }
std::vector<double> rollBall(const std::vector<double>&, int) { pending(); }
void subtractLaneBackground(cv::Mat&, const Lane2D&, const std::vector<double>&) { pending(); }
}  // namespace CloudAnalysis
namespace api {
char* rollingBallFlow(const char*, const char*, const char*, const char*) { pending(); }
char* regionAnalysisFlow(const char*, const char*, const char*, const char*, const char*) { pending(); }
char* tpnAnalysisFlow(const char*, const char*, const char*, const char*, const char*) { pending(); }
}  // namespace api
}  // namespace viraduve
