// Placeholder until detection lands; deleted by its implementation.
#include <stdexcept>
#include "detector/BandLaneDetectionImpl.h"
namespace viraduve {
[[noreturn]] static void pending() { throw std::logic_error("not implemented yet"); }
void BandLaneDetectionImpl::detect(const Image&, const ROI&, std::vector<Lane2D>&) { pending(); }
void BandLaneDetectionImpl::detect_new(const Image&, const ROI&, const std::vector<Lane2D>&, uint32_t, std::vector<Lane2D>&) { pending(); }
void BandLaneDetectionImpl::drawLaneBands(const Image&, const ROI&, const std::vector<Lane2D>&, const std::string&) { pending(); }
void BandLaneDetectionImpl::drawLaneBands(const Image&, const ROI&, const std::vector<Lane2D>&, double, const std::string&) { pending(); }
void BandLaneDetectionImpl::saveLaneBands(const Image&, const ROI&, const std::vector<Lane2D>&, double, const std::string&) { pending(); }
void BandLaneDetectionImpl::saveTPNImage(const Image&, const ROI&, const std::vector<Lane2D>&, const VerticalRange&, const std::vector<double>&, const std::string&) { pending(); }
void BandLaneDetectionImpl::prepareData(const cv::Mat&, const ROI&) { pending(); }
void BandLaneDetectionImpl::scaleAndShiftBandLanes(std::vector<Lane2D>&, const ROI&, double) { pending(); }
void BandLaneDetectionImpl::findPeaks(const cv::Mat&, std::vector<Peak>&) { pending(); }
void BandLaneDetectionImpl::computeBandWidth(int&) { pending(); }
void BandLaneDetectionImpl::initialFindBandsInOneLane(const Lane2D&, std::vector<Band2D>&) { pending(); }
void BandLaneDetectionImpl::scoreEdgePair(EdgePair&) { pending(); }
void BandLaneDetectionImpl::detectLanes(std::vector<Lane2D>&) { pending(); }
void BandLaneDetectionImpl::initialDetectLanes(std::vector<Lane2D>&) { pending(); }
void BandLaneDetectionImpl::fitLaneBasedBands(const Lane2D&, Lane2D&) { pending(); }
void BandLaneDetectionImpl::lineFittingRansac(const std::vector<cv::Point2f>&, std::vector<cv::Point2f>&, cv::Vec4f&, double) { pending(); }
void BandLaneDetectionImpl::refineLanesNew(const std::vector<Lane2D>&, std::vector<Lane2D>&) { pending(); }
void BandLaneDetectionImpl::detectBands(std::vector<Lane2D>&, uint32_t, const ROI&, std::vector<Lane2D>&) { pending(); }
void BandLaneDetectionImpl::filterBands(std::vector<Lane2D>&, uint32_t) { pending(); }
}  // namespace viraduve
