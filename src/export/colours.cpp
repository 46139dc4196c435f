// The colour table and the dark-picture test.
#include "export/colours.h"

#include <cstdlib>

#include <opencv2/imgproc.hpp>

namespace viraduve {
namespace Export {

namespace {

// The host's palette, in lookup order (duplicates as the host sends them).
const char* const kTable[] = {
    "#92F22A", "#FD5B03", "#F7A5A7", "#BFCC5A", "#FF7416", "#FEC606", "#E3000E", "#1DABB8",
    "#FF6766", "#EB9532", "#8870FF", "#2C82C9", "#BB3658", "#64DDBB", "#3D8EB9", "#D8335B",
    "#5659C9", "#FF7E55", "#44BBFF", "#A42A15", "#AE44C8", "#5991B1", "#F31D2F", "#BB1F5C",
    "#702A87", "#AA99BA", "#D33257", "#3D8EB9", "#FABF08", "#3742FA", "#FF0059", "#1DE9B6",
    "#E408B5", "#18FFFF", "#25E4A4", "#25E4A4", "#5C6B75", "#00FFFF", "#FF5000", "#FF0000",
    "#00FF00", "#0000FF", "#007FFF", "#FFA500", "#E82064", "#ADFF2F", "#009600", "#FFFF00",
    "#663300", "#9933FF", "#FF00FF", "#FFFFFF", "#000000",
};

int component(const std::string& text, std::size_t at) {
  return static_cast<int>(std::strtol(text.substr(at, 2).c_str(), nullptr, 16));
}

}  // namespace

cv::Scalar hexToScalar(const std::string& colourText) {
  for (const char* entry : kTable) {
    if (colourText != entry) continue;
    // Pure black would vanish on the dark pictures it is meant to mark.
    if (colourText == "#000000") return cv::Scalar(13, 13, 13);
    return cv::Scalar(component(colourText, 5), component(colourText, 3), component(colourText, 1));
  }
  return cv::Scalar(8, 191, 250);
}

bool isDarkPicture(const cv::Mat& picture) {
  cv::Mat grey;
  if (picture.channels() == 3) {
    cv::cvtColor(picture, grey, cv::COLOR_BGR2GRAY);
  } else {
    grey = picture;
  }
  if (grey.depth() != CV_8U) grey.convertTo(grey, CV_8U, 1.0 / 255.0);
  cv::Mat bright;
  cv::threshold(grey, bright, 128, 255, cv::THRESH_BINARY);
  const double n = static_cast<double>(bright.total());
  const double b = static_cast<double>(cv::countNonZero(bright));
  return (b - (n - b)) / n + 0.1 < 0;
}

}  // namespace Export
}  // namespace viraduve
