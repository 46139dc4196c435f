// The frame-detection driver: frames of the capture, found in its first channel.
#include <ctime>

#include "common/checked.h"
#include "common/log.h"
#include "framedetect/frame_detection.h"
#include "pipeline/ImageProcessing.h"

namespace viraduve {
namespace ImageProcessing {

void runAnalysisFrameDetection(const std::string& imageDir, std::vector<ROI>& rois,
                               const std::vector<ImageParam>& params, ImageMode mode) {
  const std::clock_t start = std::clock();
  logLine("ImageProcessing::runAnalysisFrameDetection is started.");
  logLine("Input: ");
  logLine("image_dir: ", imageDir);
  for (const ImageParam& p : params) printImageParam(p);
  logLine("image_mode: ", imageModeName(mode));

  Image image(imageDir, "ch0.tif");
  const ImageParam& first = at(params, 0);
  if (first.img_flip_h || first.img_flip_v) {
    flipChannelImage(image, image, first.img_flip_h, first.img_flip_v);
  }
  // The decoded 8-bit picture is what decoding the encoded bytes as grey would give.
  detectFrames(image.decodeGrey8(), rois, static_cast<float>(first.img_angle), mode);

  logLine("Output: ");
  for (const ROI& roi : rois) printROI(roi);
  logLine("ImageProcessing::runAnalysisFrameDetection is finished.");
  logLine("Time taken: ", secondsSince(start), "s");
}

}  // namespace ImageProcessing
}  // namespace viraduve
