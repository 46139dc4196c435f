// Placeholder until the generator lands; deleted by its implementation.
#include <stdexcept>
#include "synth.h"
namespace viraduve {
namespace synth {
Truth render(const CaptureSpec&, std::vector<cv::Mat>&) { throw std::logic_error("pending"); }
Truth writeCapture(const CaptureSpec&, const std::string&) { throw std::logic_error("pending"); }
CaptureSpec cleanGel(int, int, int, int, uint32_t) { throw std::logic_error("pending"); }
std::string truthFrameJson(const Truth&, std::size_t) { throw std::logic_error("pending"); }
std::string imageParasJson(int) { throw std::logic_error("pending"); }
}  // namespace synth
}  // namespace viraduve
