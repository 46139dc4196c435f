// A readable table of an analysis answer, for people at a terminal.
#pragma once

#include <string>

namespace viraduve {
namespace cli {

// One row per band ("frameLanesBands") or per region ("cloud_region_list"): frame, lane,
// band, channel, box, volume, background-corrected volume, normalised volume. Throws
// std::runtime_error when the answer is not such a document.
std::string summariseAnswer(const std::string& json);

}  // namespace cli
}  // namespace viraduve
