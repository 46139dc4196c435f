// Automatic analysis through the exported function: refusal before any file is touched, the
// error answer for a capture without its first channel, frames of synthetic two-membrane
// captures, and a record of what the real two-gel scan gives.
#include <cstdio>
#include <filesystem>
#include <memory>
#include <sstream>
#include <string>

#include <gtest/gtest.h>
#include <json/json.h>
#include <opencv2/imgcodecs.hpp>

#include "synth.h"
#include "test_support.h"
#include "viraduve/viraduve.h"

namespace viraduve {
namespace {

using test::StdoutCapture;
using test::TempDir;

struct Answer {
  std::string text;  // "<null>" for no answer
  std::string log;
};

Answer autoAnalysis(const std::string& dir, const char* mode, const std::string& paras) {
  Answer a;
  StdoutCapture out;
  char* answer = getAutoAnalysisFrameDetection(dir.c_str(), mode, "unused", paras.c_str());
  a.log = out.finish();
  a.text = answer ? answer : "<null>";
  releaseResult(answer);
  return a;
}

Json::Value parse(const Answer& a) {
  Json::CharReaderBuilder builder;
  builder["allowSpecialFloats"] = true;
  std::unique_ptr<Json::CharReader> reader(builder.newCharReader());
  Json::Value root;
  std::string errors;
  EXPECT_TRUE(reader->parse(a.text.data(), a.text.data() + a.text.size(), &root, &errors))
      << errors << "\n" << a.text.substr(0, 200) << "\n" << a.log.substr(0, 4000);
  return root;
}

TEST(AutoAnalysis, UnknownModeAnswersNothingAndReadsNoFile) {
  TempDir dir;
  synth::writeCapture(synth::cleanGel(120, 100, 2, 1, 3), dir.path());
  const std::vector<unsigned char> before = test::readBytes(dir.file("ch0.tif"));
  Json::Value paras;
  std::istringstream(synth::imageParasJson(1)) >> paras;
  paras["ImageParas"][0]["img_flip_h"] = true;
  const Answer a = autoAnalysis(dir.path(), "Unknown", Json::writeString(Json::StreamWriterBuilder(), paras));
  EXPECT_EQ(a.text, "<null>");
  EXPECT_EQ(a.log.find("Loaded Image Path"), std::string::npos) << a.log;
  EXPECT_EQ(test::readBytes(dir.file("ch0.tif")), before);
}

TEST(AutoAnalysis, MissingFirstChannelAnswersError) {
  TempDir dir;
  const Answer a = autoAnalysis(dir.path(), "uv", synth::imageParasJson(1));
  EXPECT_EQ(a.text, "error");
  EXPECT_NE(a.log.find("Loaded Image Path is " + dir.path() + "/ch0.tif\n"), std::string::npos);
  EXPECT_NE(a.log.find("ERROR in __FUNCTION__ = getAutoAnalysisFrameDetection\n"),
            std::string::npos)
      << a.log;
}

// Two membranes side by side, well above a noisy background (the noise spreads the dark
// class so that the two-level test of the blob route can pass).
synth::CaptureSpec twoMembranes(int width, int height, int channels) {
  synth::CaptureSpec plan;
  plan.width = width;
  plan.height = height;
  plan.channels = channels;
  plan.background = 2000.0;
  plan.noiseSigma = 400.0;
  plan.seed = 11;
  const int frameWidth = width * 2 / 5;
  for (int f = 0; f < 2; ++f) {
    synth::FrameSpec frame;
    frame.rect = cv::Rect(width / 15 + f * width / 2, height / 10, frameWidth, height * 4 / 5);
    frame.level = 25000.0;
    for (int l = 0; l < 4; ++l) {
      synth::LaneSpec lane;
      lane.centre = frameWidth * (l + 0.5) / 4;
      lane.width = frameWidth / 8 | 1;
      for (int b = 0; b < 3; ++b) {
        lane.bands.push_back({frame.rect.height * (0.2 + 0.3 * b), height / 120.0, 4.0e6});
      }
      frame.lanes.push_back(lane);
    }
    plan.frames.push_back(frame);
  }
  return plan;
}

TEST(AutoAnalysis, FindsBothMembranesWithExclusiveCorners) {
  TempDir dir;
  const synth::Truth truth = synth::writeCapture(twoMembranes(600, 400, 1), dir.path());
  const Answer a = autoAnalysis(dir.path(), "uv", synth::imageParasJson(1));
  const Json::Value frames = parse(a)["frameLanesBands"];
  ASSERT_EQ(frames.size(), 2u) << a.log.substr(0, 3000);
  EXPECT_EQ(a.log.find("before filterROI"), std::string::npos);
  for (Json::ArrayIndex f = 0; f < 2; ++f) {
    const Json::Value& roi = frames[f]["roi"];
    const synth::TruthFrame& t = truth.frames[f];
    // The blob route reports one past the last column and row.
    EXPECT_NEAR(roi["x1"].asInt(), t.x1, 2);
    EXPECT_NEAR(roi["y1"].asInt(), t.y1, 2);
    EXPECT_NEAR(roi["x2"].asInt(), t.x2 + 1, 2);
    EXPECT_NEAR(roi["y2"].asInt(), t.y2 + 1, 2);
    EXPECT_GE(frames[f]["lanes"].size(), 1u);
    std::printf("synthetic frame %u: (%d, %d, %d, %d), %u lanes (4 drawn)\n", f,
                roi["x1"].asInt(), roi["y1"].asInt(), roi["x2"].asInt(), roi["y2"].asInt(),
                frames[f]["lanes"].size());
  }
}

// The real scan of two stacked protein gels (about 14 lanes each). Detection is not tuned to
// it; the test records what is found and checks only that the answer is sound.
TEST(AutoAnalysis, RealTwoGelScanIsAnswered) {
  TempDir dir;
  // The call rewrites the channel files, so it works on a copy.
  std::filesystem::copy_file(test::dataDir() + "/gels/protein-stain-vis/ch0.tif",
                             dir.file("ch0.tif"));
  Json::Value paras;
  std::istringstream(synth::imageParasJson(1)) >> paras;
  paras["ImageParas"][0]["channelAppMode"] = "vis";
  const Answer a = autoAnalysis(dir.path(), "vis", Json::writeString(Json::StreamWriterBuilder(), paras));
  const Json::Value frames = parse(a)["frameLanesBands"];
  ASSERT_GE(frames.size(), 1u);
  const cv::Mat image = cv::imread(dir.file("ch0.tif"), cv::IMREAD_ANYDEPTH);
  for (Json::ArrayIndex f = 0; f < frames.size(); ++f) {
    const Json::Value& roi = frames[f]["roi"];
    EXPECT_LE(roi["x2"].asInt(), image.cols - 1);
    EXPECT_LE(roi["y2"].asInt(), image.rows - 1);
    std::string bands;
    for (const Json::Value& lane : frames[f]["lanes"]) {
      bands += " " + std::to_string(lane["bands"].size());
    }
    std::printf("gel scan frame %u: (%d, %d, %d, %d), %u lanes, bands per lane:%s\n", f,
                roi["x1"].asInt(), roi["y1"].asInt(), roi["x2"].asInt(), roi["y2"].asInt(),
                frames[f]["lanes"].size(), bands.c_str());
  }
}

}  // namespace
}  // namespace viraduve
