// The synthetic capture generator: its pixels must match the truth it reports, since the
// detection and quantification tests rely on both.
#include <cmath>

#include <gtest/gtest.h>
#include <json/json.h>
#include <opencv2/imgcodecs.hpp>

#include "synth.h"
#include "test_support.h"

namespace viraduve {
namespace synth {
namespace {

bool samePixels(const cv::Mat& a, const cv::Mat& b) {
  return a.size() == b.size() && a.type() == b.type() && cv::norm(a, b, cv::NORM_INF) == 0.0;
}

CaptureSpec noisyGel(uint32_t seed) {
  CaptureSpec plan = cleanGel(256, 256, 4, 3, seed);
  plan.channels = 2;
  plan.noiseSigma = 40.0;
  plan.dust = 5;
  return plan;
}

TEST(Synth, SameSeedSamePixelsOtherSeedOtherNoise) {
  std::vector<cv::Mat> a, b, c;
  render(noisyGel(7), a);
  render(noisyGel(7), b);
  render(noisyGel(8), c);
  ASSERT_EQ(a.size(), 2u);
  for (std::size_t i = 0; i < a.size(); ++i) {
    EXPECT_EQ(a[i].type(), CV_16UC1);
    EXPECT_TRUE(samePixels(a[i], b[i]));
    EXPECT_FALSE(samePixels(a[i], c[i]));
  }
  // Channels carry their own noise.
  EXPECT_FALSE(samePixels(a[0], a[1]));
}

TEST(Synth, CleanGelIntensityLiesInTheTruthBoxes) {
  std::vector<cv::Mat> ch;
  const Truth truth = render(cleanGel(512, 512, 6, 4, 3), ch);
  ASSERT_EQ(truth.frames.size(), 1u);
  const TruthFrame& f = truth.frames[0];
  ASSERT_EQ(f.lanes.size(), 6u);
  cv::Mat marked = cv::Mat::zeros(ch[0].size(), CV_8U);
  for (const TruthLane& lane : f.lanes) {
    ASSERT_EQ(lane.bands.size(), 4u);
    for (const TruthBand& b : lane.bands) {
      ASSERT_GE(b.x1, f.x1);
      ASSERT_LE(b.x2, f.x2);
      double peak;
      cv::minMaxLoc(ch[0](cv::Rect(b.x1, b.y1, b.x2 - b.x1 + 1, b.y2 - b.y1 + 1)), nullptr, &peak);
      EXPECT_GT(peak, 2000 + 15000);
      EXPECT_LT(peak, 2000 + 45000);
      // Grown by the edge ramp and to +-4.5 sigma: everything brighter lies inside.
      const int grow = (b.y2 - b.y1) / 2 + 2;
      marked(cv::Rect(cv::Point(b.x1 - 2, b.y1 - grow), cv::Point(b.x2 + 3, b.y2 + grow + 1))).setTo(255);
    }
  }
  for (int y = 0; y < ch[0].rows; ++y)
    for (int x = 0; x < ch[0].cols; ++x)
      if (!marked.at<uchar>(y, x)) ASSERT_LE(ch[0].at<uint16_t>(y, x), 2000 + 60) << x << "," << y;
}

struct VolumeCase {
  const char* name;
  double tilt, smile, slope, level;
  double scale1;  // scale of channel 1
};

void PrintTo(const VolumeCase& c, std::ostream* os) { *os << c.name; }

class SynthVolume : public ::testing::TestWithParam<VolumeCase> {};

// Sum of (pixel - known background) around each band equals the requested volume.
TEST_P(SynthVolume, BandVolumeMatchesRequest) {
  const VolumeCase& p = GetParam();
  CaptureSpec plan = cleanGel(400, 300, 3, 3, 11);
  plan.channels = 2;
  plan.channelScale = {1.0, p.scale1};
  plan.tiltDegrees = p.tilt;
  plan.smile = p.smile;
  plan.slope = p.slope;
  plan.frames[0].level = p.level;
  std::vector<cv::Mat> ch;
  const Truth truth = render(plan, ch);
  const cv::Rect frame = plan.frames[0].rect;
  for (int c = 0; c < 2; ++c) {
    const double scale = c == 0 ? 1.0 : p.scale1;
    for (const TruthLane& lane : truth.frames[0].lanes) {
      for (const TruthBand& b : lane.bands) {
        const int halfRows = (b.y2 - b.y1) + 12;  // the +-2 sigma box is 4 sigma high
        double sum = 0.0;
        for (int y = b.y1 + (b.y2 - b.y1) / 2 - halfRows; y <= b.y1 + (b.y2 - b.y1) / 2 + halfRows; ++y)
          for (int x = b.x1 - 12; x <= b.x2 + 12; ++x) {
            const bool inFrame = frame.contains(cv::Point(x, y));
            sum += ch[c].at<uint16_t>(y, x) -
                   std::round(plan.background + plan.slope * y + (inFrame ? p.level : 0));
          }
        if (scale == 0.0)
          EXPECT_EQ(sum, 0.0);
        else
          EXPECT_NEAR(sum, b.volume * scale, 0.01 * b.volume * scale) << p.name << " channel " << c;
      }
    }
  }
}

INSTANTIATE_TEST_SUITE_P(
    Renderings, SynthVolume,
    ::testing::Values(VolumeCase{"plain", 0, 0, 0, 0, 1.0},
                      VolumeCase{"tilted", 3.0, 0, 0, 0, 0.5},
                      VolumeCase{"smiling", 0, 0.0004, 0, 0, 1.5},
                      VolumeCase{"sloped_membrane", -2.0, 0, 1.5, 3000, 0.0}),
    [](const ::testing::TestParamInfo<VolumeCase>& i) { return std::string(i.param.name); });

TEST(Synth, CrowdedLanesKeepTheirBandsApart) {
  std::vector<cv::Mat> ch;
  const Truth truth = render(cleanGel(256, 256, 2, 9, 1), ch);
  const auto& bands = truth.frames[0].lanes[0].bands;
  ASSERT_EQ(bands.size(), 9u);
  for (std::size_t i = 1; i < bands.size(); ++i) {
    const double height = bands[i].y2 - bands[i].y1;
    EXPECT_GE(bands[i].centreRow - bands[i - 1].centreRow, 2.5 * height);
  }
  EXPECT_THROW(cleanGel(64, 64, 1, 40, 1), std::invalid_argument);
}

TEST(Synth, TiltMovesTheLaneBottomRight) {
  CaptureSpec plan = cleanGel(300, 300, 2, 1, 1);
  plan.tiltDegrees = 5.0;
  std::vector<cv::Mat> ch;
  const Truth truth = render(plan, ch);
  const TruthLane& lane = truth.frames[0].lanes[0];
  const int frameHeight = truth.frames[0].y2 - truth.frames[0].y1;
  EXPECT_NEAR(lane.centreBottom - lane.centreTop, frameHeight * std::tan(5.0 * CV_PI / 180.0), 1e-9);
}

TEST(Synth, DarkOnBrightIsTheInverse) {
  CaptureSpec plan = noisyGel(5);
  std::vector<cv::Mat> bright, dark;
  render(plan, bright);
  plan.darkOnBright = true;
  render(plan, dark);
  for (std::size_t c = 0; c < bright.size(); ++c) {
    cv::Mat sum;
    cv::add(bright[c], dark[c], sum, cv::noArray(), CV_32S);
    double lo, hi;
    cv::minMaxLoc(sum, &lo, &hi);
    EXPECT_EQ(lo, 65535.0);
    EXPECT_EQ(hi, 65535.0);
  }
}

TEST(Synth, SaturationClipsOnlyWhenAsked) {
  CaptureSpec plan = cleanGel(200, 200, 2, 1, 1);
  plan.frames[0].lanes[0].bands[0].volume *= 10.0;
  std::vector<cv::Mat> ch;
  EXPECT_THROW(render(plan, ch), std::invalid_argument);
  plan.saturate = true;
  render(plan, ch);
  double hi;
  cv::minMaxLoc(ch[0], nullptr, &hi);
  EXPECT_EQ(hi, 65535.0);
}

TEST(Synth, DustSitsAtTheSamePlaceInEveryChannel) {
  CaptureSpec plan;
  plan.width = plan.height = 128;
  plan.channels = 2;
  plan.dust = 10;
  std::vector<cv::Mat> ch;
  render(plan, ch);
  cv::Mat bright0 = ch[0] > 30000, bright1 = ch[1] > 30000;
  EXPECT_GE(cv::countNonZero(bright0), 10);
  EXPECT_EQ(cv::countNonZero(bright0 != bright1), 0);
}

TEST(Synth, WrittenCaptureReadsBackAs16Bit) {
  test::TempDir dir;
  CaptureSpec plan = noisyGel(2);
  plan.channels = 3;
  const std::string folder = dir.file("capture");
  writeCapture(plan, folder);
  std::vector<cv::Mat> expected;
  render(plan, expected);
  for (int c = 0; c < 3; ++c) {
    cv::Mat read = cv::imread(folder + "/ch" + std::to_string(c) + ".tif", cv::IMREAD_UNCHANGED);
    ASSERT_FALSE(read.empty()) << c;
    EXPECT_EQ(read.type(), CV_16UC1);
    EXPECT_TRUE(samePixels(read, expected[c]));
  }
}

Json::Value parse(const std::string& text) {
  Json::Value root;
  Json::Reader reader;
  EXPECT_TRUE(reader.parse(text, root)) << reader.getFormattedErrorMessages();
  return root;
}

TEST(Synth, TruthFrameDocumentDescribesTheTruth) {
  CaptureSpec plan = cleanGel(300, 200, 3, 2, 4);
  plan.channels = 2;
  plan.tiltDegrees = 1.0;
  std::vector<cv::Mat> ch;
  const Truth truth = render(plan, ch);
  const Json::Value frame = parse(truthFrameJson(truth, 0))["analysisFrame"];
  const TruthFrame& f = truth.frames[0];
  EXPECT_EQ(frame["x1"].asInt(), f.x1);
  EXPECT_EQ(frame["y1"].asInt(), f.y1);
  EXPECT_EQ(frame["x2"].asInt(), f.x2);
  EXPECT_EQ(frame["y2"].asInt(), f.y2);
  EXPECT_EQ(frame["x3"].asInt(), f.x2);  // top right
  EXPECT_EQ(frame["y3"].asInt(), f.y1);
  EXPECT_EQ(frame["x4"].asInt(), f.x1);  // bottom left
  EXPECT_EQ(frame["y4"].asInt(), f.y2);
  const Json::Value& lanes = frame["roiList"];
  ASSERT_EQ(lanes.size(), 3u);
  for (Json::ArrayIndex i = 0; i < lanes.size(); ++i) {
    const Json::Value& lane = lanes[i]["lane"];
    EXPECT_EQ(lane["x1"].asInt(), std::lround(f.lanes[i].centreTop));
    EXPECT_EQ(lane["x2"].asInt(), std::lround(f.lanes[i].centreBottom));
    EXPECT_EQ(lane["y1"].asInt(), f.y1);
    EXPECT_EQ(lane["y2"].asInt(), f.y2);
    EXPECT_EQ(lane["width"].asInt(), f.lanes[i].width);
    EXPECT_FALSE(lane["update_flag"].asBool());
    const Json::Value& bands = lanes[i]["bands"];
    ASSERT_EQ(bands.size(), 4u);  // 2 bands x 2 channels, grouped by channel
    for (Json::ArrayIndex k = 0; k < bands.size(); ++k) {
      const TruthBand& b = f.lanes[i].bands[k % 2];
      EXPECT_EQ(bands[k]["channel"].asInt(), static_cast<int>(k / 2));
      EXPECT_EQ(bands[k]["y1"].asInt(), b.y1);
      EXPECT_EQ(bands[k]["x2"].asInt(), b.x2);
      EXPECT_FALSE(bands[k]["uid"].asString().empty());
    }
  }
  EXPECT_THROW(truthFrameJson(truth, 1), std::out_of_range);
}

TEST(Synth, ImageParasHasOneElementPerChannel) {
  for (int n : {1, 3}) {
    const Json::Value paras = parse(imageParasJson(n))["ImageParas"];
    ASSERT_EQ(paras.size(), static_cast<Json::ArrayIndex>(n));
    EXPECT_EQ(paras[0]["img_max"].asInt(), 65535);
    EXPECT_EQ(paras[n - 1]["channelAppMode"].asString(), "chemi");
  }
}

}  // namespace
}  // namespace synth
}  // namespace viraduve
