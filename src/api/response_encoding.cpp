// Response JSON through cereal's JSON archive with its default options: RapidJSON's pretty
// writer, 4-space indent, shortest round-trip doubles, NaN and Infinity written as tokens.
// Hosts read the members by name but in this order, so the order below is part of the format.
#include "api/response_encoding.h"

#include <sstream>

#include <cereal/archives/json.hpp>
#include <cereal/types/string.hpp>
#include <cereal/types/vector.hpp>

namespace viraduve {

namespace {

using cereal::make_nvp;

// The members of a lane without its bands: a response lane entry is {"lane": ..., "bands": ...}.
struct LaneFields {
  const CloudLane& lane;
};

// One element of the frame list: {"lane": fields, "bands": [...]}.
struct LaneEntry {
  const CloudLane& lane;
};

}  // namespace

// cereal finds these through the record types' namespace (file-local all the same).
static void save(cereal::JSONOutputArchive& ar, const SensitivityEntry& s) {
  ar(make_nvp("channel", s.channel), make_nvp("value", s.value));
}

static void save(cereal::JSONOutputArchive& ar, const CloudFrame& f) {
  ar(make_nvp("x1", f.x1), make_nvp("y1", f.y1), make_nvp("x2", f.x2), make_nvp("y2", f.y2),
     make_nvp("x3", f.x3), make_nvp("y3", f.y3), make_nvp("x4", f.x4), make_nvp("y4", f.y4),
     make_nvp("sensitivity", f.sensitivity), make_nvp("uid", f.uid),
     make_nvp("annotateText", f.annotateText));
}

static void save(cereal::JSONOutputArchive& ar, const CloudBand& b) {
  ar(make_nvp("channel", b.channel), make_nvp("x1", b.x1), make_nvp("y1", b.y1),
     make_nvp("x2", b.x2), make_nvp("y2", b.y2), make_nvp("mw_b", b.mw_b),
     make_nvp("band_s_x", b.band_s_x), make_nvp("band_s_x_raw", b.band_s_x_raw),
     make_nvp("band_s_y", b.band_s_y), make_nvp("volume", b.volume), make_nvp("area", b.area),
     make_nvp("density", b.density), make_nvp("median_intensity", b.median_intensity),
     make_nvp("rf", b.rf), make_nvp("purity_band", b.purity_band),
     make_nvp("purity_lane", b.purity_lane), make_nvp("local_bg_volume", b.local_bg_volume),
     make_nvp("local_bg_density", b.local_bg_density),
     make_nvp("global_bg_volume", b.global_bg_volume),
     make_nvp("global_bg_density", b.global_bg_density),
     make_nvp("rolling_bg_volume", b.rolling_bg_volume),
     make_nvp("rolling_bg_density", b.rolling_bg_density),
     make_nvp("lane_bg_volume", b.lane_bg_volume), make_nvp("lane_bg_density", b.lane_bg_density),
     make_nvp("wm", b.wm), make_nvp("r_quantity", b.r_quantity),
     make_nvp("a_quantity", b.a_quantity), make_nvp("volume_norm", b.volume_norm),
     make_nvp("density_norm", b.density_norm),
     make_nvp("local_bg_volume_norm", b.local_bg_volume_norm),
     make_nvp("local_bg_density_norm", b.local_bg_density_norm),
     make_nvp("global_bg_volume_norm", b.global_bg_volume_norm),
     make_nvp("global_bg_density_norm", b.global_bg_density_norm),
     make_nvp("rolling_bg_volume_norm", b.rolling_bg_volume_norm),
     make_nvp("rolling_bg_density_norm", b.rolling_bg_density_norm),
     make_nvp("lane_bg_volume_norm", b.lane_bg_volume_norm),
     make_nvp("lane_bg_density_norm", b.lane_bg_density_norm), make_nvp("uid", b.uid),
     make_nvp("annotateText", b.annotateText));
}

namespace {

void save(cereal::JSONOutputArchive& ar, const LaneFields& fields) {
  const CloudLane& l = fields.lane;
  ar(make_nvp("x1", l.x1), make_nvp("y1", l.y1), make_nvp("x2", l.x2), make_nvp("y2", l.y2),
     make_nvp("width", l.width), make_nvp("num_bands", l.num_bands), make_nvp("lane_s", l.lane_s),
     make_nvp("mw", l.mw), make_nvp("update_flag", l.update_flag), make_nvp("uid", l.uid),
     make_nvp("annotateText", l.annotateText), make_nvp("norm_factor", l.norm_factor),
     make_nvp("lane_volume", l.lane_volume),
     make_nvp("lane_background_volume", l.lane_background_volume),
     make_nvp("lane_adjusted_volume", l.lane_adjusted_volume));
}

void save(cereal::JSONOutputArchive& ar, const LaneEntry& entry) {
  ar(make_nvp("lane", LaneFields{entry.lane}), make_nvp("bands", entry.lane.bands));
}

}  // namespace

static void save(cereal::JSONOutputArchive& ar, const CloudFrameLanes& f) {
  std::vector<LaneEntry> entries;
  entries.reserve(f.lanes.size());
  for (const CloudLane& lane : f.lanes) entries.push_back(LaneEntry{lane});
  ar(make_nvp("roi", f.roi), make_nvp("lanes", entries));
}

static void save(cereal::JSONOutputArchive& ar, const CloudRegion& r) {
  ar(make_nvp("channel", r.channel), make_nvp("circle_b", r.circle_b), make_nvp("x1", r.x1),
     make_nvp("y1", r.y1), make_nvp("x2", r.x2), make_nvp("y2", r.y2), make_nvp("x", r.x),
     make_nvp("y", r.y), make_nvp("circle_radius", r.circle_radius),
     make_nvp("volume", r.volume), make_nvp("area", r.area), make_nvp("density", r.density),
     make_nvp("median_intensity", r.median_intensity), make_nvp("purity", r.purity),
     make_nvp("local_bg_volume", r.local_bg_volume),
     make_nvp("local_bg_density", r.local_bg_density),
     make_nvp("global_bg_volume", r.global_bg_volume),
     make_nvp("global_bg_density", r.global_bg_density),
     make_nvp("rolling_bg_volume", r.rolling_bg_volume),
     make_nvp("rolling_bg_density", r.rolling_bg_density), make_nvp("r_quantity", r.r_quantity),
     make_nvp("a_quantity", r.a_quantity), make_nvp("uid", r.uid), make_nvp("name", r.name),
     make_nvp("refName", r.refName), make_nvp("backgroundCorrected", r.backgroundCorrected),
     make_nvp("bgColor", r.bgColor));
}

namespace {

// The archive opens the root object on construction and closes it when destroyed.
template <typename List>
std::string encodeEnvelope(const char* name, const List& list) {
  std::ostringstream os;
  {
    cereal::JSONOutputArchive ar(os);
    ar(make_nvp(name, list));
  }
  return os.str();
}

}  // namespace

namespace api {

std::string encodeFrames(const std::vector<CloudFrameLanes>& frames) {
  return encodeEnvelope("frameLanesBands", frames);
}

std::string encodeRegions(const std::vector<CloudRegion>& regions) {
  return encodeEnvelope("cloud_region_list", regions);
}

std::vector<CloudFrameLanes> buildFrameLanes(const std::vector<CloudFrame>& cloudFrames,
                                             const std::vector<std::vector<CloudLane>>& cloudLanes) {
  std::vector<CloudFrameLanes> frames;
  frames.reserve(cloudFrames.size());
  for (std::size_t i = 0; i < cloudFrames.size(); ++i) {
    CloudFrameLanes f;
    f.roi = cloudFrames[i];
    // A frame without a lane list (none was decoded or merged for it) answers no lanes.
    if (i < cloudLanes.size()) f.lanes = cloudLanes[i];
    frames.push_back(std::move(f));
  }
  return frames;
}

}  // namespace api
}  // namespace viraduve
