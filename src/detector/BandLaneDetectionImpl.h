// The detector's implementation: state and every operation. One .cpp per concern:
// prepare (prepareData, scaleAndShiftBandLanes, detect, detect_new, lane angles),
// peaks, bands (band width, bands of one lane), lanes, band_update (detectBands,
// filterBands), quantification, regions, normalization, drawing.
// Internal operations are public so that the tests can reach them; hosts only see the
// abstract interface.
#pragma once

#include <opencv2/core.hpp>

#include "viraduve/BandLaneDetection.h"

namespace viraduve {

// A profile peak: position (index into the profile) and value.
struct Peak {
  int position = 0;
  float value = 0.0f;
};

// A band edge: type +1 top edge, -1 bottom edge.
struct Edge {
  int position = 0;
  float value = 0.0f;
  int type = 0;
};

// A candidate pair of left/right band edges and its score.
struct EdgePair {
  int l = 0;
  int r = 0;
  double vl = 0.0;
  double vr = 0.0;
  double m = 0.0;
  int c = 0;
  float bw = 0.0f;
  float score = 0.0f;
};

class BandLaneDetectionImpl : public BandLaneDetection {
 public:
  BandLaneDetectionImpl();

  // Slots of the interface, in order.
  void detect(const Image& image, const ROI& frame, std::vector<Lane2D>& lanes) override;
  void detect_new(const Image& image, const ROI& frame, const std::vector<Lane2D>& lanesIn,
                  uint32_t channel, std::vector<Lane2D>& lanesOut) override;
  void analyis(const Image& image, std::vector<Region2D>& regions, uint32_t channel,
               const Circle& gbCircle, int32_t radius) override;
  void analyis(const Image& image, std::vector<Region2D>& regions, uint32_t channel,
               const ROI& gbRoi, int32_t radius) override;
  void analyis(const Image& image, std::vector<Lane2D>& lanes, uint32_t channel,
               const Circle& gbCircle, int32_t radius) override;
  void analyis(const Image& image, std::vector<Lane2D>& lanes, uint32_t channel,
               const ROI& gbRoi, int32_t radius) override;
  uint32_t countLanesWithinAngle(const std::vector<Lane2D>& lanes, std::vector<Lane2D>& outside,
                                 float minAngle, float maxAngle) override;
  uint32_t countLanesWithinAngle2(const std::vector<Lane2D>& lanes, std::vector<Lane2D>& outside,
                                  float minAngle, float maxAngle) override;
  void computeAllNormFactor(const Image& image, const std::vector<VerticalRange>& verticalRanges,
                            std::vector<std::vector<Lane2D>>& allBandlanes, int32_t rbRadius,
                            double widthRatio, std::vector<std::vector<double>>& allNormFactor,
                            std::vector<std::vector<double>>& allLaneVolume,
                            std::vector<std::vector<double>>& allLaneBackgroundVolume,
                            std::vector<std::vector<double>>& allLaneAdjustedVolume) override;
  void drawLaneBands(const Image& image, const ROI& frame, const std::vector<Lane2D>& lanes,
                     const std::string& windowName) override;
  void drawLaneBands(const Image& image, const ROI& frame, const std::vector<Lane2D>& lanes,
                     double bandThreshold, const std::string& windowName) override;
  void saveLaneBands(const Image& image, const ROI& frame, const std::vector<Lane2D>& lanes,
                     double bandThreshold, const std::string& path) override;
  void saveTPNImage(const Image& image, const ROI& frame, const std::vector<Lane2D>& lanes,
                    const VerticalRange& verticalRange, const std::vector<double>& normFactors,
                    const std::string& path) override;
  ~BandLaneDetectionImpl() override;

  // Data preparation and coordinate mapping (prepare.cpp).
  void prepareData(const cv::Mat& img, const ROI& roi);
  void scaleAndShiftBandLanes(std::vector<Lane2D>& lanes, const ROI& roi, double scaleFactor);

  // Profile peaks (peaks.cpp).
  static void findPeaks(const cv::Mat& profile, std::vector<Peak>& peaks);

  // Band width and the bands of one candidate lane (bands.cpp).
  void computeBandWidth(int& bandWidth);
  void initialFindBandsInOneLane(const Lane2D& lane, std::vector<Band2D>& bands);
  static void scoreEdgePair(EdgePair& pair);

  // Lanes (lanes.cpp).
  void detectLanes(std::vector<Lane2D>& lanes);
  void initialDetectLanes(std::vector<Lane2D>& lanesIni);
  void fitLaneBasedBands(const Lane2D& laneIn, Lane2D& laneOut);
  void lineFittingRansac(const std::vector<cv::Point2f>& points, std::vector<cv::Point2f>& inliers,
                         cv::Vec4f& line, double threshold);
  void refineLanesNew(const std::vector<Lane2D>& lanesIn, std::vector<Lane2D>& lanesOut);

  // Band update in given lanes (band_update.cpp).
  void detectBands(std::vector<Lane2D>& lanes, uint32_t channel, const ROI& frame,
                   std::vector<Lane2D>& lanesOut);
  void filterBands(std::vector<Lane2D>& lanes, uint32_t channel);

  // Median of a float matrix: the element of index n/2 after a partial selection.
  static float computeMedian(const cv::Mat& matrix);

  // State (see prepareData).
  cv::Mat_<float> image_;
  cv::Mat_<float> normed_image_;
  cv::Mat_<float> scaled_image_;
  cv::Mat_<float> img_norm_;
  cv::Mat_<float> grad_x_1;
  cv::Mat_<float> grad_x_2;
  cv::Mat_<float> grad_y_1;
  cv::Mat_<float> grad_y_2;
  cv::Mat_<float> smoothed_image_;
  double scale_factor_ = 1.0;
  int32_t background_ = -1;
  int32_t band_width_ = 0;
};

}  // namespace viraduve
