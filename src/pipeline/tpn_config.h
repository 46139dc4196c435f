// Strip width and rolling-ball radius of the total-protein measurement, and the optional
// "tpn.cfg" lines that override them. Internal; reachable by the tests.
#pragma once

#include <cstdint>
#include <istream>
#include <string>

namespace viraduve {

struct TpnSettings {
  int rbRadius = 0;
  double widthRatio = 0.9;
};

// Defaults from the capture geometry: resolution (pixels per mm) = 2704 / (binning * 184) *
// opticalZoom, radius 4 mm capped at a quarter of the short side, width ratio 0.9. Also
// returns the resolution and the short side in mm. Refuses a binning of 0 (-4).
TpnSettings defaultTpnSettings(int rows, int cols, double opticalZoom, uint32_t binning,
                               double& resolution, double& shortSideMm);

// One configuration line: "band lane width (in %)" = 25..100 sets the width ratio,
// "rolling ball size (in mm)" = (0, shortSideMm) sets the radius; anything else is ignored.
void applyTpnConfigLine(const std::string& line, double shortSideMm, double resolution,
                        TpnSettings& settings);
// Every line of in, logged and applied in order (a later valid line overrides).
void readTpnConfig(std::istream& in, double shortSideMm, double resolution, TpnSettings& settings);

}  // namespace viraduve
