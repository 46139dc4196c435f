// Band update in given lanes: band finding along each lane and the band filter.
#include <gtest/gtest.h>

#include <cmath>
#include <string>
#include <vector>

#include "detector/BandLaneDetectionImpl.h"
#include "quiet.h"
#include "synth.h"

namespace viraduve {
namespace {

Band2D boxBand(int x1, int y1, int x2, int y2, double contrast) {
  Band2D band;
  band.x1 = x1;
  band.y1 = y1;
  band.x2 = x2;
  band.y2 = y2;
  band.lane_bg_volume = contrast;
  return band;
}

TEST(FilterBands, RejectionCodesAndScores) {
  Lane2D lane;
  lane.y1 = 0;
  lane.y2 = 1000;  // rows 10 .. 990 are far enough from the ends
  lane.update_flag = true;
  lane.bands = {
      boxBand(0, 5, 40, 30, 0.5),        // too close to the top
      boxBand(0, 100, 20, 130, 0.5),     // 30 high, 20 wide: ratio 1.5
      boxBand(0, 200, 40, 220, 0.0005),  // too weak
      boxBand(0, 300, 40, 320, 0.01),    // valid: 0.01^0.2
      boxBand(0, 980, 40, 995, 0.5),     // too close to the bottom
  };
  Lane2D untouched = lane;
  untouched.update_flag = false;
  std::vector<Lane2D> lanes = {lane, untouched};
  BandLaneDetectionImpl detector;
  const std::string log = test::logOf([&] { detector.filterBands(lanes, 0); });

  for (const char* line : {"band_0 is too close to edge and rejected.",
                           "band_1 has a large height to width ratio and is rejected.",
                           "band_2 mean intensity is too low and is rejected.",
                           "band_4 is too close to edge and rejected.", "lane_1 is unchanged."})
    EXPECT_NE(log.find(line), std::string::npos) << line;
  ASSERT_EQ(lanes[0].bands.size(), 1u);
  EXPECT_EQ(lanes[0].bands[0].y1, 300);
  EXPECT_NEAR(lanes[0].bands[0].band_s_x, 0.398107, 1e-6);  // 0.01 to the power 0.2
  EXPECT_FALSE(lanes[0].update_flag);
  // A lane without the flag passes untouched.
  ASSERT_EQ(lanes[1].bands.size(), 5u);
  EXPECT_EQ(lanes[1].bands[0].band_s_x, 0.0);
}

TEST(FilterBands, OverlappingBandsAreClippedToEachOther) {
  Lane2D lane;
  lane.y1 = 0;
  lane.y2 = 1000;
  lane.update_flag = true;
  lane.bands = {boxBand(0, 100, 100, 150, 0.2), boxBand(0, 140, 100, 190, 0.2),
                boxBand(0, 185, 100, 230, 0.2)};
  std::vector<Lane2D> lanes = {lane};
  BandLaneDetectionImpl detector;
  test::logOf([&] { detector.filterBands(lanes, 0); });
  const std::vector<Band2D>& b = lanes[0].bands;
  ASSERT_EQ(b.size(), 3u);
  // The first ends where the second begins; the second then starts at the first's new end.
  EXPECT_EQ(b[0].y1, 100);
  EXPECT_EQ(b[0].y2, 140);
  EXPECT_EQ(b[1].y1, 140);
  EXPECT_EQ(b[1].y2, 185);
  EXPECT_EQ(b[2].y1, 185);
  EXPECT_EQ(b[2].y2, 230);
}

Image imageOf(const cv::Mat& picture) {
  Image image;
  image.setMat(picture);
  return image;
}

Lane2D laneFor(const synth::TruthFrame& frame, const synth::TruthLane& t) {
  Lane2D lane;
  lane.x1 = static_cast<int>(std::lround(t.centreTop));
  lane.x2 = static_cast<int>(std::lround(t.centreBottom));
  lane.y1 = frame.y1;
  lane.y2 = frame.y2;
  lane.width = t.width;
  lane.update_flag = true;
  return lane;
}

class BandUpdateOnGel : public ::testing::Test {
 protected:
  void SetUp() override {
    std::vector<cv::Mat> channels;
    truth_ = synth::render(synth::cleanGel(700, 500, 5, 4, 11), channels);
    image_ = imageOf(channels[0]);
    frame_ = truth_.frames[0];
    for (const synth::TruthLane& t : frame_.lanes) lanes_.push_back(laneFor(frame_, t));
  }
  std::vector<Lane2D> update(const ROI& frame, const std::vector<Lane2D>& lanes,
                             uint32_t channel = 0) {
    std::vector<Lane2D> out;
    BandLaneDetectionImpl detector;
    test::logOf([&] { detector.detect_new(image_, frame, lanes, channel, out); });
    return out;
  }
  ROI frameRoi() const { return ROI{frame_.x1, frame_.y1, frame_.x2, frame_.y2}; }

  synth::Truth truth_;
  synth::TruthFrame frame_;
  Image image_;
  std::vector<Lane2D> lanes_;
};

TEST_F(BandUpdateOnGel, FindsTheBandsOfEveryGivenLane) {
  const std::vector<Lane2D> out = update(frameRoi(), lanes_, 3);
  ASSERT_EQ(out.size(), lanes_.size());
  for (std::size_t i = 0; i < out.size(); ++i) {
    const synth::TruthLane& t = frame_.lanes[i];
    EXPECT_EQ(out[i].x1, lanes_[i].x1);
    EXPECT_FALSE(out[i].update_flag);
    EXPECT_EQ(out[i].bands.size(), t.bands.size()) << "lane " << i;
    for (const synth::TruthBand& tb : t.bands) {
      bool found = false;
      for (const Band2D& b : out[i].bands)
        found = found || (b.y1 <= tb.centreRow && tb.centreRow <= b.y2 && b.channel == 3 &&
                          b.band_s_x > 0.0);
      EXPECT_TRUE(found) << "lane " << i << " band at row " << tb.centreRow;
    }
  }
}

// The drivers pass the frame unclamped; a frame reaching past the image measures its
// background on the part inside the image.
TEST_F(BandUpdateOnGel, FramePastTheImageEdgeIsClamped) {
  const ROI whole{0, 0, image_.cols() - 1, image_.rows() - 1};
  const ROI beyond{-5, -7, image_.cols() + 4, image_.rows() + 9};
  std::vector<Lane2D> inside;
  std::vector<Lane2D> outside;
  ASSERT_NO_THROW(inside = update(whole, lanes_));
  ASSERT_NO_THROW(outside = update(beyond, lanes_));
  ASSERT_EQ(inside.size(), outside.size());
  for (std::size_t i = 0; i < inside.size(); ++i) {
    ASSERT_EQ(inside[i].bands.size(), outside[i].bands.size());
    for (std::size_t j = 0; j < inside[i].bands.size(); ++j)
      EXPECT_EQ(inside[i].bands[j].band_s_x, outside[i].bands[j].band_s_x);
  }
  const ROI offImage{image_.cols() + 10, 0, image_.cols() + 50, 40};
  EXPECT_NO_THROW(update(offImage, lanes_));
}

TEST_F(BandUpdateOnGel, LanesNotMarkedKeepTheirBandsOfTheChannel) {
  std::vector<Lane2D> lanes = lanes_;
  Lane2D& kept = lanes[2];
  kept.update_flag = false;
  kept.mw = true;
  Band2D mine = boxBand(1, 2, 3, 4, 0.0);  // any geometry
  mine.channel = 1;
  Band2D other = boxBand(5, 6, 7, 8, 0.0);
  other.channel = 0;
  kept.bands = {mine, other, mine};
  // Lanes come back ordered by x1 whatever the input order.
  std::swap(lanes[0], lanes[4]);
  const std::vector<Lane2D> out = update(frameRoi(), lanes, 1);
  ASSERT_EQ(out.size(), 5u);
  for (std::size_t i = 1; i < out.size(); ++i) EXPECT_LT(out[i - 1].x1, out[i].x1);
  ASSERT_EQ(out[2].bands.size(), 2u);
  EXPECT_EQ(out[2].bands[0].x1, 1);
  EXPECT_EQ(out[2].bands[1].channel, 1u);
  EXPECT_FALSE(out[2].mw);
}

// Lanes the user may draw badly: no width, no height, upside down, outside the image.
TEST_F(BandUpdateOnGel, DegenerateLanesGiveNoBands) {
  auto laneOf = [](int x1, int y1, int x2, int y2, int width) {
    Lane2D lane;
    lane.x1 = x1;
    lane.y1 = y1;
    lane.x2 = x2;
    lane.y2 = y2;
    lane.width = width;
    lane.update_flag = true;
    return lane;
  };
  const Lane2D& real = lanes_[1];
  const struct {
    const char* name;
    Lane2D lane;
    bool mayHaveBands;
  } cases[] = {
      {"zero width", laneOf(real.x1, real.y1, real.x2, real.y2, 0), false},
      {"y1 == y2", laneOf(real.x1, 200, real.x2 + 30, 200, real.width), false},
      {"single point", laneOf(real.x1, 200, real.x1, 200, real.width), false},
      {"upside down", laneOf(real.x1, real.y2, real.x2, real.y1, real.width), false},
      {"right of the image", laneOf(5000, 0, 5000, 400, 40), false},
      {"nearly horizontal", laneOf(0, 100, 699, 101, 40), true},
      {"rows past the image", laneOf(real.x1, -300, real.x2, 900, real.width), true},
      {"huge width", laneOf(real.x1, real.y1, real.x2, real.y2, 100000), true},
  };
  for (const auto& c : cases) {
    std::vector<Lane2D> lanes = {lanes_[0], c.lane, lanes_[2]};
    std::vector<Lane2D> out;
    ASSERT_NO_THROW(out = update(frameRoi(), lanes)) << c.name;
    ASSERT_EQ(out.size(), 3u) << c.name;
    for (const Lane2D& lane : out) {
      if (lane.x1 == c.lane.x1 && lane.y1 == c.lane.y1 && !c.mayHaveBands)
        EXPECT_TRUE(lane.bands.empty()) << c.name;
      for (const Band2D& b : lane.bands) {
        EXPECT_LE(b.x1, b.x2) << c.name;
        EXPECT_GE(b.x1, 0) << c.name;
        EXPECT_LT(b.x2, image_.cols()) << c.name;
      }
    }
  }
}

// Wide pictures are smoothed before the band update, narrow ones are not. The median of a
// band box is a grey level of the picture only when nothing was smoothed; the background
// level is 0 here, so the contrast (band_s_x to the power 5) is that median.
TEST(DetectBands, WidePicturesAreSmoothed) {
  for (const int cols : {901, 902}) {
    // Alternating 255 / 51 columns, with three-row ramps at the top and bottom: the edges
    // must be wider than the 3 x 3 erosion of the edge images.
    cv::Mat picture(300, cols, CV_8UC1, cv::Scalar(0));
    std::vector<int> levels = {0};
    for (int x = 430; x <= 470; ++x) {
      const int peak = (x - 430) % 2 == 0 ? 255 : 51;
      for (int r = 0; r < 3; ++r) {
        const int ramp = peak * (r + 1) / 4;
        picture.at<uchar>(137 + r, x) = static_cast<uchar>(ramp);
        picture.at<uchar>(163 - r, x) = static_cast<uchar>(ramp);
        levels.push_back(ramp);
      }
      picture(cv::Rect(x, 140, 1, 21)).setTo(peak);
      levels.push_back(peak);
    }
    Lane2D lane;
    lane.x1 = lane.x2 = 450;
    lane.y1 = 0;
    lane.y2 = 299;
    lane.width = 40;
    lane.update_flag = true;
    std::vector<Lane2D> out;
    BandLaneDetectionImpl detector;
    test::logOf([&] {
      detector.detect_new(imageOf(picture), ROI{0, 0, cols - 1, 299}, {lane}, 0, out);
    });
    ASSERT_EQ(out.size(), 1u);
    ASSERT_EQ(out[0].bands.size(), 1u) << cols;
    const double contrast = std::pow(out[0].bands[0].band_s_x, 5.0);
    bool rawLevel = false;
    for (int level : levels) rawLevel = rawLevel || std::fabs(contrast - level / 255.0) < 1e-6;
    EXPECT_EQ(rawLevel, cols == 901) << cols << ": " << contrast;
  }
}

}  // namespace
}  // namespace viraduve
