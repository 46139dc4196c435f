// Inspection drawings of the detector's results: the frame (blue), lane centre lines (green)
// and band boxes (red) over the grey picture, shown in a window or written to a file, and a
// drawing of the total-protein layout with lane numbers and factors.
#include <cstdio>
#include <cstdlib>

#include <opencv2/highgui.hpp>
#include <opencv2/imgcodecs.hpp>
#include <opencv2/imgproc.hpp>

#include "detector/BandLaneDetectionImpl.h"

namespace viraduve {

namespace {

const char* const kSourceFile = "DaduZerovoVur\\BandLaneDetection";
const cv::Scalar kBlue(255, 0, 0);
const cv::Scalar kGreen(0, 255, 0);
const cv::Scalar kRed(0, 0, 255);

// The picture as a 3-channel grey canvas to draw on in colour.
cv::Mat greyCanvas(const Image& image, const char* function, int line) {
  cv::Mat src = image.decodeGrey8();
  if (!(!src.empty() && (src.channels() == 1 || src.channels() == 3)))
    cv::error(cv::Error::StsAssert, "!src.empty() && (src.channels() == 1 || src.channels() == 3)",
              function, kSourceFile, line);
  if (src.channels() == 3) cv::cvtColor(src, src, cv::COLOR_BGR2GRAY);
  cv::Mat canvas;
  const cv::Mat planes[] = {src, src, src};
  cv::merge(planes, 3, canvas);
  return canvas;
}

void drawFrameAndLanes(cv::Mat& canvas, const ROI& frame, const std::vector<Lane2D>& lanes) {
  cv::rectangle(canvas, cv::Point(frame.x1, frame.y1), cv::Point(frame.x2, frame.y2), kBlue, 1);
  for (const Lane2D& lane : lanes)
    cv::line(canvas, cv::Point(lane.x1, lane.y1), cv::Point(lane.x2, lane.y2), kGreen, 1,
             cv::LINE_8);
}

// Band boxes whose score (band_s_y, the detection score) is not below the threshold.
void drawBands(cv::Mat& canvas, const std::vector<Lane2D>& lanes, double bandThreshold) {
  for (const Lane2D& lane : lanes)
    for (const Band2D& band : lane.bands)
      if (!(band.band_s_y < bandThreshold))
        cv::rectangle(canvas, cv::Point(band.x1, band.y1), cv::Point(band.x2, band.y2), kRed, 1);
}

// highgui ends the process when it cannot reach a display, so the window is only opened
// where one is announced.
void show(const std::string& windowName, const cv::Mat& canvas, const char* function) {
  const char* x11 = std::getenv("DISPLAY");
  const char* wayland = std::getenv("WAYLAND_DISPLAY");
  const bool haveDisplay = (x11 && *x11) || (wayland && *wayland);
  if (!haveDisplay)
    throw Exception(-4, "ERROR! No display to show the drawing (DISPLAY and WAYLAND_DISPLAY are unset)",
                    function, kSourceFile, __LINE__);
  cv::imshow(windowName, canvas);
  cv::waitKey(0);
}

}  // namespace

void BandLaneDetectionImpl::drawLaneBands(const Image& image, const ROI& frame,
                                          const std::vector<Lane2D>& lanes,
                                          const std::string& windowName) {
  const char* function = "viraduve::BandLaneDetectionImpl::drawLaneBands";
  cv::Mat canvas = greyCanvas(image, function, __LINE__);
  drawFrameAndLanes(canvas, frame, lanes);
  show(windowName, canvas, function);
}

void BandLaneDetectionImpl::drawLaneBands(const Image& image, const ROI& frame,
                                          const std::vector<Lane2D>& lanes, double bandThreshold,
                                          const std::string& windowName) {
  const char* function = "viraduve::BandLaneDetectionImpl::drawLaneBands";
  cv::Mat canvas = greyCanvas(image, function, __LINE__);
  drawFrameAndLanes(canvas, frame, lanes);
  drawBands(canvas, lanes, bandThreshold);
  show(windowName, canvas, function);
}

void BandLaneDetectionImpl::saveLaneBands(const Image& image, const ROI& frame,
                                          const std::vector<Lane2D>& lanes, double bandThreshold,
                                          const std::string& path) {
  cv::Mat canvas = greyCanvas(image, "viraduve::BandLaneDetectionImpl::saveLaneBands", __LINE__);
  drawFrameAndLanes(canvas, frame, lanes);
  drawBands(canvas, lanes, bandThreshold);
  cv::imwrite(path, canvas);
}

void BandLaneDetectionImpl::saveTPNImage(const Image& image, const ROI& frame,
                                         const std::vector<Lane2D>& lanes,
                                         const VerticalRange& verticalRange,
                                         const std::vector<double>& normFactors,
                                         const std::string& path) {
  cv::Mat canvas = greyCanvas(image, "viraduve::BandLaneDetectionImpl::saveTPNImage", __LINE__);
  cv::rectangle(canvas, cv::Point(frame.x1, frame.y1), cv::Point(frame.x2, frame.y2), kBlue, 1);

  // The rows between which the lanes were measured: top thin, bottom thick, so the two
  // limits can be told apart.
  const int top = static_cast<int>(verticalRange[0]);
  const int bottom = static_cast<int>(verticalRange[1]);
  cv::line(canvas, cv::Point(frame.x1, top), cv::Point(frame.x2, top), kBlue, 1, cv::LINE_8);
  cv::line(canvas, cv::Point(frame.x1, bottom), cv::Point(frame.x2, bottom), kBlue, 2,
           cv::LINE_8);

  // Each lane: its centre line, its number above the frame and its factor under the range.
  for (std::size_t i = 0; i < lanes.size(); ++i) {
    const Lane2D& lane = lanes[i];
    cv::line(canvas, cv::Point(lane.x1, lane.y1), cv::Point(lane.x2, lane.y2), kGreen, 1,
             cv::LINE_8);
    const std::string number = std::to_string(i + 1);
    cv::putText(canvas, number, cv::Point(lane.x1 - 4, frame.y1 + 14), cv::FONT_HERSHEY_PLAIN,
                1.0, kGreen, 1, cv::LINE_8);
    if (i < normFactors.size()) {
      char factor[32];
      std::snprintf(factor, sizeof factor, "%.3f", normFactors[i]);
      cv::putText(canvas, factor, cv::Point(lane.x2 - 12, bottom + 12), cv::FONT_HERSHEY_PLAIN,
                  0.5, kGreen, 1, cv::LINE_8);
    }
  }
  cv::imwrite(path, canvas);
}

}  // namespace viraduve
