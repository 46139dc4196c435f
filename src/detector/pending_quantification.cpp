// Placeholder until quantification and the drivers land; deleted by their implementation.
#include <stdexcept>
#include "detector/BandLaneDetectionImpl.h"
#include "pipeline/ImageProcessing.h"
#include "detector/measure.h"
namespace viraduve {
[[noreturn]] static void pending() { throw std::logic_error("not implemented yet"); }
void BandLaneDetectionImpl::analyis(const Image&, std::vector<Lane2D>&, uint32_t, const Circle&, int32_t) { pending(); }
void BandLaneDetectionImpl::analyis(const Image&, std::vector<Lane2D>&, uint32_t, const ROI&, int32_t) { pending(); }
float BandLaneDetectionImpl::computeMedian(const cv::Mat&) { pending(); }
bool invertForAnalysis(ImageMode, const std::vector<int>&, const std::vector<ImageParam>&, std::size_t) { pending(); }
bool invertForDetection(ImageMode, const std::vector<int>&, const std::vector<ImageParam>&, std::size_t) { pending(); }
void prepareAnalysisImages(const Image&, int, int, cv::Mat&, cv::Mat&) { pending(); }
double globalBackgroundRect(const cv::Mat&, const ROI&) { pending(); }
double globalBackgroundCircle(const cv::Mat&, const Circle&) { pending(); }
BoxMeasures measureBox(const cv::Mat&, const cv::Mat&, const ROI&, double) { pending(); }
float laneMaskSum(const cv::Mat&, const Lane2D&) { pending(); }
namespace ImageProcessing {
void setRawImageDefaultBackground(ImageMode, const std::vector<ImageParam>&, std::vector<int>&, bool) { pending(); }
void computeImageForLaneDetection(const std::vector<Image>&, ImageMode, const std::vector<ImageParam>&, Image&) { pending(); }
void runBandLandeDetection(const std::string&, LanesPerFrame&, const std::vector<ROI>&, const std::vector<ImageParam>&, ImageMode) { pending(); }
void updateBandDetection(const std::string&, LanesPerFrame&, const std::vector<ImageParam>&, ImageMode) { pending(); }
void runBandLandeAnalysis(const std::string&, LanesPerFrame&, const std::vector<ImageParam>&, ImageMode) { pending(); }
}  // namespace ImageProcessing
}  // namespace viraduve
