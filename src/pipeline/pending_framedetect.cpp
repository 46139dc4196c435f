// Placeholder until frame detection lands; deleted by its implementation.
#include <stdexcept>
#include "pipeline/ImageProcessing.h"
namespace viraduve {
namespace ImageProcessing {
void runAnalysisFrameDetection(const std::string&, std::vector<ROI>&, const std::vector<ImageParam>&, ImageMode) { throw std::logic_error("not implemented yet"); }
}  // namespace ImageProcessing
}  // namespace viraduve
