// Converts an image file into the format of the target's extension, as one grey channel that
// keeps a 16-bit depth. The status says whether the target was written: 1 only then, -1
// otherwise (unreadable source, refused or failed write, any error), so that a host never
// goes on with a file that does not exist.
#include <exception>
#include <string>

#include <opencv2/imgcodecs.hpp>

#include "api/call_frame.h"
#include "api/flows.h"
#include "common/log.h"

namespace viraduve {
namespace api {

int vitToTiffFlow(const char* source, const char* target) {
  try {
    const cv::Mat image = cv::imread(textArg(source), cv::IMREAD_ANYDEPTH);
    // An unreadable source leaves the image empty, and OpenCV refuses to write that.
    return cv::imwrite(textArg(target), image) ? 1 : -1;
  } catch (const std::exception& e) {
    logLine("Exception converting image to TIFF format: ", e.what());
    return -1;
  } catch (...) {
    return -1;
  }
}

}  // namespace api
}  // namespace viraduve
