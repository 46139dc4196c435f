// `viraduve demo`: a first look at the library in one command. It writes a capture (a
// synthetic two-channel chemiluminescence blot, or a copy of a real DNA gel), runs the
// automatic analysis, prints the band table, and exports a picture with the results drawn.
#pragma once

#include <string>

namespace viraduve {
namespace cli {

struct DemoOptions {
  std::string out;      // working folder; empty: a new folder under the temporary directory
  bool real = false;    // the real DNA gel instead of the synthetic blot
  std::string gel;      // folder of the real gel (ch0.tif); empty: the one in the source tree
  bool verbose = false; // library log to standard error instead of the log files
};

// Runs the demo and returns the exit status (0 done, 1 the library failed, 2 refused).
// Throws UsageError for an unusable working folder or a missing real gel.
int runDemo(const DemoOptions& options);

// The frames of an analysis answer ({"frameLanesBands": [...]}) as the export's frame list
// ([{"analysisFrame": {...}}, ...]). Automatic analysis fills only the first two corners of a
// frame; the other two are completed from them so the outline is drawn as a rectangle.
std::string exportFramesFromAnswer(const std::string& answer);
// True when text is an analysis answer (an object holding "frameLanesBands"); NaN and
// Infinity tokens are accepted, as answers may hold them.
bool isFramesAnswer(const std::string& text);

}  // namespace cli
}  // namespace viraduve
