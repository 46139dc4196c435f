// The four detection and quantification entry points from request to answer, on synthetic
// captures, as a host calls them.
#include <gtest/gtest.h>

#include <memory>
#include <sstream>
#include <string>

#include <json/json.h>
#include <opencv2/imgcodecs.hpp>

#include "synth.h"
#include "test_support.h"
#include "viraduve/viraduve.h"

namespace viraduve {
namespace {

using test::StdoutCapture;
using test::TempDir;

// The answer's text, released; "<null>" for no answer.
std::string takeAnswer(char* answer) {
  if (answer == nullptr) return "<null>";
  const std::string text(answer);
  releaseResult(answer);
  return text;
}

// Answers may hold NaN and Infinity tokens. Called outside any output capture, so that
// failures show.
Json::Value parseAnswer(const std::string& text, const std::string& log) {
  EXPECT_NE(text, "<null>") << log;
  EXPECT_NE(text, "error") << log;
  Json::CharReaderBuilder builder;
  builder["allowSpecialFloats"] = true;
  std::unique_ptr<Json::CharReader> reader(builder.newCharReader());
  Json::Value root;
  std::string errors;
  EXPECT_TRUE(reader->parse(text.data(), text.data() + text.size(), &root, &errors)) << errors;
  return root;
}

std::string toText(const Json::Value& v) {
  Json::StreamWriterBuilder builder;
  return Json::writeString(builder, v);
}

// Mode "uv" suits the one-channel bright-on-dark captures: no channel is inverted.
struct Gel {
  TempDir dir;
  synth::Truth truth;
  Gel() { truth = synth::writeCapture(synth::cleanGel(240, 200, 3, 2, 7), dir.path()); }
  const char* path() const { return dir.path().c_str(); }
};

TEST(DetectionFlows, BandLaneAnalysisMergesIntoTheRequestAndClearsRollingMeasures) {
  Gel gel;
  Json::Value request;
  std::istringstream(synth::truthFrameJson(gel.truth, 0)) >> request;
  request["analysisFrame"]["roiList"][0]["bands"][0]["rolling_bg_volume"] = 12.5;
  request["analysisFrame"]["roiList"][0]["lane"]["annotateText"] = "first lane";
  const std::string frame = toText(request);
  const std::string paras = synth::imageParasJson(1);

  StdoutCapture out;
  const std::string text =
      takeAnswer(getBandLaneAnalysis(gel.path(), frame.c_str(), "uv", nullptr, paras.c_str()));
  const std::string log = out.finish();
  const Json::Value answer = parseAnswer(text, log);
  EXPECT_NE(log.find("in getBandLaneAnalysis:: url = " + gel.dir.path() + "\n"),
            std::string::npos);

  const Json::Value& frames = answer["frameLanesBands"];
  ASSERT_EQ(frames.size(), 1u);
  EXPECT_EQ(frames[0]["roi"]["uid"].asString(), "frame0");
  const Json::Value& lanes = frames[0]["lanes"];
  const Json::Value& requested = request["analysisFrame"]["roiList"];
  ASSERT_EQ(lanes.size(), requested.size());
  EXPECT_EQ(lanes[0]["lane"]["annotateText"].asString(), "first lane");
  for (Json::ArrayIndex j = 0; j < lanes.size(); ++j) {
    EXPECT_EQ(lanes[j]["lane"]["uid"], requested[j]["lane"]["uid"]);
    ASSERT_EQ(lanes[j]["bands"].size(), requested[j]["bands"].size());
    for (const Json::Value& band : lanes[j]["bands"]) {
      EXPECT_EQ(band["rolling_bg_volume"].asDouble(), 0.0);
      EXPECT_EQ(band["rolling_bg_density"].asDouble(), 0.0);
      EXPECT_GT(band["volume"].asDouble(), 0.0);
    }
  }
  EXPECT_EQ(lanes[0]["bands"][0]["uid"], requested[0]["bands"][0]["uid"]);
}

TEST(DetectionFlows, FlipsAreWrittenToTheChannelFile) {
  Gel gel;
  const cv::Mat before = cv::imread(gel.dir.file("ch0.tif"), cv::IMREAD_ANYDEPTH);
  Json::Value paras;
  std::istringstream(synth::imageParasJson(1)) >> paras;
  paras["ImageParas"][0]["img_flip_h"] = true;
  const std::string frame = synth::truthFrameJson(gel.truth, 0);

  StdoutCapture out;
  const std::string text = takeAnswer(
      getBandLaneAnalysis(gel.path(), frame.c_str(), "uv", nullptr, toText(paras).c_str()));
  const std::string log = out.finish();
  parseAnswer(text, log);
  // The drivers receive the parameters with the flip already baked in.
  EXPECT_NE(log.find("img_flip_h: 0\n"), std::string::npos);
  EXPECT_EQ(log.find("img_flip_h: 1\n"), std::string::npos);
  cv::Mat expected;
  cv::flip(before, expected, 1);
  const cv::Mat after = cv::imread(gel.dir.file("ch0.tif"), cv::IMREAD_ANYDEPTH);
  ASSERT_EQ(after.size(), expected.size());
  EXPECT_EQ(cv::norm(after, expected, cv::NORM_INF), 0.0);
}

TEST(DetectionFlows, AutoAnalysisFindsFramesLanesAndBands) {
  Gel gel;
  const std::string paras = synth::imageParasJson(1);
  StdoutCapture out;
  const std::string text =
      takeAnswer(getAutoAnalysisFrameDetection(gel.path(), "UV", "ignored", paras.c_str()));
  const std::string log = out.finish();
  const Json::Value answer = parseAnswer(text, log);
  for (const char* line :
       {"Calling auto analysis\nmode: UV\n", "runAnalysisFrameDetection over\n",
        "runBandLandeDetection over\n", "runBandLandeAnalysis over\n",
        "auto analysis is done by ImageProcessing layer\n"}) {
    EXPECT_NE(log.find(line), std::string::npos) << line;
  }
  const Json::Value& frames = answer["frameLanesBands"];
  ASSERT_GE(frames.size(), 1u);
  EXPECT_EQ(frames[0]["roi"]["uid"].asString(), "");
  EXPECT_GE(frames[0]["lanes"].size(), 1u);
}

TEST(DetectionFlows, CustomFrameAndBandUpdateAnswerTheRequestFrame) {
  Gel gel;
  const std::string frame = synth::truthFrameJson(gel.truth, 0);
  const std::string paras = synth::imageParasJson(1);
  StdoutCapture out;
  const std::string customText = takeAnswer(
      getCustomAnalysisFrame(gel.path(), frame.c_str(), "uv", nullptr, paras.c_str()));
  const std::string updatedText = takeAnswer(
      getUpdateBandDetection(gel.path(), frame.c_str(), "uv", nullptr, paras.c_str()));
  const std::string log = out.finish();
  const Json::Value custom = parseAnswer(customText, log);
  const Json::Value updated = parseAnswer(updatedText, log);
  ASSERT_EQ(custom["frameLanesBands"].size(), 1u);
  EXPECT_EQ(custom["frameLanesBands"][0]["roi"]["uid"].asString(), "frame0");
  EXPECT_GE(custom["frameLanesBands"][0]["lanes"].size(), 1u);
  ASSERT_EQ(updated["frameLanesBands"].size(), 1u);
  EXPECT_EQ(updated["frameLanesBands"][0]["lanes"].size(), gel.truth.frames[0].lanes.size());
}

}  // namespace
}  // namespace viraduve
