// Exchange records to working records and back. Coming back, results are merged into the
// request's records by position, so identifiers and texts the analyses do not compute pass
// through unchanged.
#include "model/conversion.h"

#include <algorithm>
#include <cmath>

#include "common/log.h"

namespace viraduve {

namespace {

// Measures the host divides by or takes logarithms of must stay positive; NaN is kept so
// that a failed measure stays visible.
double floorTiny(double v) { return std::isnan(v) ? v : std::max(1e-10, v); }

double nanToZero(double v) { return std::isnan(v) ? 0.0 : v; }

}  // namespace

ImageParam toImageParam(const CloudImageParam& p) {
  ImageParam out;
  out.img_min = p.img_min;
  out.img_max = p.img_max;
  out.img_gamma = static_cast<float>(p.img_gamma);
  out.img_angle = p.img_angle;
  out.img_invert = p.img_invert;
  out.img_flip_h = p.img_flip_h;
  out.img_flip_v = p.img_flip_v;
  out.channelType = p.channelAppMode;
  out.backgroundInverted = p.backgroundInverted;
  return out;
}

ROI toROI(const CloudFrame& f) {
  ROI roi;
  roi.x1 = static_cast<int32_t>(f.x1);
  roi.y1 = static_cast<int32_t>(f.y1);
  roi.x2 = static_cast<int32_t>(f.x2);
  roi.y2 = static_cast<int32_t>(f.y2);
  return roi;
}

Band2D toBand2D(const CloudBand& b) {
  Band2D out;
  out.channel = b.channel;
  out.x1 = static_cast<int32_t>(b.x1);
  out.y1 = static_cast<int32_t>(b.y1);
  out.x2 = static_cast<int32_t>(b.x2);
  out.y2 = static_cast<int32_t>(b.y2);
  out.mw_b = b.mw_b;
  out.band_s_x = b.band_s_x;
  out.band_s_y = b.band_s_y;
  out.area = b.area;
  out.volume = b.volume;
  out.density = b.density;
  out.median_intensity = b.median_intensity;
  out.rf = b.rf;
  out.purity_band = b.purity_band;
  out.purity_lane = b.purity_lane;
  out.local_bg_volume = b.local_bg_volume;
  out.local_bg_density = b.local_bg_density;
  out.global_bg_volume = b.global_bg_volume;
  out.global_bg_density = b.global_bg_density;
  out.rolling_bg_volume = b.rolling_bg_volume;
  out.rolling_bg_density = b.rolling_bg_density;
  out.lane_bg_volume = b.lane_bg_volume;
  out.lane_bg_density = b.lane_bg_density;
  out.wm = b.wm;
  out.r_quantity = b.r_quantity;
  out.a_quantity = b.a_quantity;
  out.volume_norm = b.volume_norm;
  out.density_norm = b.density_norm;
  out.local_bg_volume_norm = b.local_bg_volume_norm;
  out.local_bg_density_norm = b.local_bg_density_norm;
  out.global_bg_volume_norm = b.global_bg_volume_norm;
  out.global_bg_density_norm = b.global_bg_density_norm;
  out.rolling_bg_volume_norm = b.rolling_bg_volume_norm;
  out.rolling_bg_density_norm = b.rolling_bg_density_norm;
  out.lane_bg_volume_norm = b.lane_bg_volume_norm;
  out.lane_bg_density_norm = b.lane_bg_density_norm;
  return out;
}

Lane2D toLane2D(const CloudLane& l) {
  Lane2D out;
  out.x1 = static_cast<int32_t>(l.x1);
  out.y1 = static_cast<int32_t>(l.y1);
  out.x2 = static_cast<int32_t>(l.x2);
  out.y2 = static_cast<int32_t>(l.y2);
  out.width = static_cast<int32_t>(l.width);
  out.num_bands = static_cast<int32_t>(l.num_bands);
  out.mw = l.mw;
  out.update_flag = l.update_flag;
  out.bands.reserve(l.bands.size());
  for (const CloudBand& b : l.bands) out.bands.push_back(toBand2D(b));
  return out;
}

Region2D toRegion2D(const CloudRegion& r) {
  Region2D out;
  out.channel = r.channel;
  out.circle_b = r.circle_b;
  out.x1 = r.x1;
  out.y1 = r.y1;
  out.x2 = r.x2;
  out.y2 = r.y2;
  out.x = r.x;
  out.y = r.y;
  out.circle_radius = r.circle_radius;
  out.volume = r.volume;
  out.area = r.area;
  out.density = r.density;
  out.median_intensity = r.median_intensity;
  out.purity = r.purity;
  out.local_bg_volume = r.local_bg_volume;
  out.local_bg_density = r.local_bg_density;
  out.global_bg_volume = r.global_bg_volume;
  out.global_bg_density = r.global_bg_density;
  out.rolling_bg_volume = r.rolling_bg_volume;
  out.rolling_bg_density = r.rolling_bg_density;
  out.r_quantity = r.r_quantity;
  out.a_quantity = r.a_quantity;
  return out;
}

std::vector<Region2D> toRegion2DList(const std::vector<CloudRegion>& regions) {
  std::vector<Region2D> out;
  out.reserve(regions.size());
  for (const CloudRegion& r : regions) out.push_back(toRegion2D(r));
  return out;
}

void mergeBand(const Band2D& band, CloudBand& cloud) {
  cloud.channel = band.channel;
  cloud.x1 = static_cast<uint32_t>(band.x1);
  cloud.y1 = static_cast<uint32_t>(band.y1);
  cloud.x2 = static_cast<uint32_t>(band.x2);
  cloud.y2 = static_cast<uint32_t>(band.y2);
  cloud.mw_b = band.mw_b;
  cloud.band_s_x = band.band_s_x;
  cloud.band_s_y = floorTiny(band.band_s_y);
  cloud.area = band.area;
  cloud.volume = band.volume;
  cloud.density = nanToZero(band.density);
  cloud.median_intensity = band.median_intensity;
  cloud.rf = band.rf;
  cloud.purity_band = band.purity_band;
  cloud.purity_lane = band.purity_lane;
  cloud.local_bg_volume = band.local_bg_volume;
  cloud.local_bg_density = nanToZero(band.local_bg_density);
  cloud.global_bg_volume = band.global_bg_volume;
  cloud.global_bg_density = nanToZero(band.global_bg_density);
  cloud.rolling_bg_volume = band.rolling_bg_volume;
  cloud.rolling_bg_density = nanToZero(band.rolling_bg_density);
  cloud.lane_bg_volume = band.lane_bg_volume;
  cloud.lane_bg_density = band.lane_bg_density;
  cloud.wm = floorTiny(band.wm);
  cloud.r_quantity = floorTiny(band.r_quantity);
  cloud.a_quantity = band.a_quantity;
  cloud.volume_norm = band.volume_norm;
  cloud.density_norm = band.density_norm;
  cloud.local_bg_volume_norm = band.local_bg_volume_norm;
  cloud.local_bg_density_norm = band.local_bg_density_norm;
  cloud.global_bg_volume_norm = band.global_bg_volume_norm;
  cloud.global_bg_density_norm = floorTiny(band.global_bg_density_norm);
  cloud.rolling_bg_volume_norm = band.rolling_bg_volume_norm;
  cloud.rolling_bg_density_norm = band.rolling_bg_density_norm;
  cloud.lane_bg_volume_norm = band.lane_bg_volume_norm;
  cloud.lane_bg_density_norm = band.lane_bg_density_norm;
}

void mergeRegion(const Region2D& region, CloudRegion& cloud) {
  cloud.channel = region.channel;
  cloud.circle_b = region.circle_b;
  cloud.x1 = region.x1;
  cloud.y1 = region.y1;
  cloud.x2 = region.x2;
  cloud.y2 = region.y2;
  cloud.x = region.x;
  cloud.y = region.y;
  cloud.circle_radius = region.circle_radius;
  cloud.volume = region.volume;
  cloud.area = region.area;
  // An empty circle divides by a zero area; its densities answer 0 as a band's do.
  cloud.density = nanToZero(region.density);
  cloud.median_intensity = region.median_intensity;
  cloud.purity = region.purity;
  cloud.local_bg_volume = region.local_bg_volume;
  cloud.local_bg_density = nanToZero(region.local_bg_density);
  cloud.global_bg_volume = region.global_bg_volume;
  cloud.global_bg_density = nanToZero(region.global_bg_density);
  cloud.rolling_bg_volume = region.rolling_bg_volume;
  cloud.rolling_bg_density = nanToZero(region.rolling_bg_density);
  cloud.r_quantity = region.r_quantity;
  cloud.a_quantity = region.a_quantity;
}

void instrument2cloudAnalysisObject(std::vector<CloudFrame>& cloudFrames,
                                    std::vector<std::vector<CloudLane>>& cloudLanes,
                                    std::vector<ROI> rois,
                                    std::vector<std::vector<Lane2D>> lanes2d) {
  logLine("In instrument2cloudAnalysisObject");
  for (std::size_t i = 0; i < rois.size(); ++i) {
    if (cloudFrames.size() <= i) cloudFrames.emplace_back();
    CloudFrame& frame = cloudFrames[i];
    frame.x1 = static_cast<uint32_t>(rois[i].x1);
    frame.y1 = static_cast<uint32_t>(rois[i].y1);
    frame.x2 = static_cast<uint32_t>(rois[i].x2);
    frame.y2 = static_cast<uint32_t>(rois[i].y2);
  }
  for (std::size_t i = 0; i < lanes2d.size(); ++i) {
    if (cloudLanes.size() <= i) cloudLanes.emplace_back();
    std::vector<CloudLane>& lanes = cloudLanes[i];
    for (std::size_t j = 0; j < lanes2d[i].size(); ++j) {
      if (lanes.size() <= j) lanes.emplace_back();
      const Lane2D& lane = lanes2d[i][j];
      CloudLane& cloud = lanes[j];
      cloud.x1 = static_cast<uint32_t>(lane.x1);
      cloud.y1 = static_cast<uint32_t>(lane.y1);
      cloud.x2 = static_cast<uint32_t>(lane.x2);
      cloud.y2 = static_cast<uint32_t>(lane.y2);
      cloud.width = static_cast<uint32_t>(lane.width);
      cloud.num_bands = static_cast<uint32_t>(lane.num_bands);
      cloud.mw = lane.mw;
      cloud.update_flag = lane.update_flag;
      for (std::size_t k = 0; k < lane.bands.size(); ++k) {
        if (cloud.bands.size() <= k) cloud.bands.emplace_back();
        mergeBand(lane.bands[k], cloud.bands[k]);
      }
    }
  }
  logLine("band lane done");
}

}  // namespace viraduve
