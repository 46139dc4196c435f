// The entry points' own paths: refusals, parse failures, decoding errors, null arguments,
// the file conversion, and calls from several threads.
#include <gtest/gtest.h>

#include <filesystem>
#include <functional>
#include <memory>
#include <string>
#include <thread>
#include <vector>

#include <opencv2/imgcodecs.hpp>

#include "api/call_frame.h"
#include "test_support.h"
#include "viraduve/viraduve.h"

namespace viraduve {
namespace {

namespace fs = std::filesystem;
using test::StdoutCapture;
using test::TempDir;

const char kFlipParas[] = R"({"ImageParas": [{"img_flip_h": true, "img_max": 65535}]})";
const char kFrame[] = R"({"analysisFrame": {"x1": 0, "y1": 0, "x2": 9, "y2": 9, "roiList": []}})";

// A one-channel capture whose file must stay untouched by refused requests.
struct Capture {
  TempDir dir;
  std::vector<unsigned char> bytes;
  Capture() {
    cv::Mat m(10, 12, CV_16UC1);
    cv::randu(m, 0, 65535);
    test::writeImage(dir.file("ch0.tif"), m);
    bytes = test::readBytes(dir.file("ch0.tif"));
  }
  bool untouched() const { return test::readBytes(dir.file("ch0.tif")) == bytes; }
};

std::string answerOf(char* answer) {
  if (answer == nullptr) return "<null>";
  std::string text(answer);
  releaseResult(answer);
  return text;
}

TEST(EntryPoints, UnknownModeIsRefusedBeforeAnyFileIsRead) {
  Capture capture;
  const char* dir = capture.dir.path().c_str();
  StdoutCapture out;
  EXPECT_EQ(getAutoAnalysisFrameDetection(dir, "Unknown", nullptr, kFlipParas), nullptr);
  EXPECT_EQ(getCustomAnalysisFrame(dir, kFrame, "", nullptr, kFlipParas), nullptr);
  const std::string log = out.finish();
  EXPECT_EQ(log, "in getAutoAnalysisFrameDetection:: url = " + capture.dir.path() +
                     "\nin getCustomAnalysisFrame:: url = " + capture.dir.path() + "\n");
  EXPECT_TRUE(capture.untouched());
}

TEST(EntryPoints, UnparsableDocumentsAreRefusedWithTheirFailureLines) {
  Capture capture;
  const char* dir = capture.dir.path().c_str();
  const struct {
    std::function<char*()> call;
    const char* failureLine;
  } cases[] = {
      {[&] { return getUpdateBandDetection(dir, "{", "chemi", nullptr, kFlipParas); },
       "Failed to parse analysis Frame\n* Line 1, Column 2\n"},
      {[&] { return getBandLaneAnalysis(dir, kFrame, "chemi", nullptr, "[1,"); },
       "Failed to parse image params\n"},
      // The image parameters are parsed first here, so the frame's failure shows after them.
      {[&] { return getBandLaneAnalysis(dir, "", "chemi", nullptr, kFlipParas); },
       "Failed to parse analysis Frame\n"},
      {[&] { return getCustomAnalysisFrame(dir, kFrame, "chemi", nullptr, "nope"); },
       "Failed to parse image params\n"},
      {[&] { return getAutoAnalysisFrameDetection(dir, "chemi", nullptr, nullptr); },
       "Failed to parse image params\n"},
  };
  for (const auto& c : cases) {
    StdoutCapture out;
    EXPECT_EQ(c.call(), nullptr);
    const std::string log = out.finish();
    EXPECT_NE(log.find(c.failureLine), std::string::npos) << log;
    EXPECT_EQ(log.find("ERROR in __FUNCTION__"), std::string::npos) << log;
  }
  // Nothing was decoded, so the flip was never applied.
  EXPECT_TRUE(capture.untouched());
}

TEST(EntryPoints, DecodingErrorsAnswerError) {
  Capture capture;
  const char* dir = capture.dir.path().c_str();
  const struct {
    std::function<char*()> call;
    const char* expectedLog;
  } cases[] = {
      {[&] {
         return getBandLaneAnalysis(dir, kFrame, "chemi", nullptr,
                                    R"({"ImageParas": [{"img_max": "abc"}]})");
       },
       "Value is not convertible to Int.\nERROR in __FUNCTION__ = getBandLaneAnalysis\n"},
      {[&] {
         return getUpdateBandDetection(
             dir, R"({"analysisFrame": {"roiList": [{"bands": [{"x1": -1}]}]}})", "chemi",
             nullptr, kFlipParas);
       },
       "LargestInt out of UInt range\nERROR in __FUNCTION__ = getUpdateBandDetection\n"},
      {[&] {
         return getCustomAnalysisFrame(dir, R"({"analysisFrame": [1]})", "chemi", nullptr,
                                       kFlipParas);
       },
       "requires objectValue or nullValue\nERROR in __FUNCTION__ = getCustomAnalysisFrame\n"},
      {[&] {
         return getAutoAnalysisFrameDetection(dir, "chemi", nullptr,
                                              std::string(5000, '[').c_str());
       },
       "Exceeded stackLimit in readValue().\n"
       "ERROR in __FUNCTION__ = getAutoAnalysisFrameDetection\n"},
  };
  for (const auto& c : cases) {
    StdoutCapture out;
    char* answer = c.call();
    const std::string log = out.finish();
    EXPECT_EQ(answer, api::kErrorAnswer);
    EXPECT_NE(log.find(c.expectedLog), std::string::npos) << log;
    releaseResult(answer);  // ignored for the constant answer
  }
  // The faulty request was fully decoded before any file was touched.
  EXPECT_TRUE(capture.untouched());
}

TEST(EntryPoints, NullArgumentsReadAsEmptyText) {
  StdoutCapture out;
  EXPECT_EQ(getAutoAnalysisFrameDetection(nullptr, nullptr, nullptr, nullptr), nullptr);
  EXPECT_EQ(getBandLaneAnalysis(nullptr, nullptr, nullptr, nullptr, nullptr), nullptr);
  EXPECT_EQ(getUpdateBandDetection(nullptr, nullptr, nullptr, nullptr, nullptr), nullptr);
  EXPECT_EQ(getCustomAnalysisFrame(nullptr, nullptr, "chemi", nullptr, nullptr), nullptr);
  EXPECT_EQ(vitToTiff(nullptr, nullptr), -1);
  const std::string log = out.finish();
  EXPECT_NE(log.find("in getBandLaneAnalysis:: url = \nFailed to parse image params\n"),
            std::string::npos)
      << log;
  releaseResult(nullptr);
}

TEST(EntryPoints, CallsFromSeveralThreadsAnswerAsSerialCalls) {
  std::vector<std::unique_ptr<Capture>> captures;
  for (int i = 0; i < 4; ++i) captures.push_back(std::make_unique<Capture>());
  // Each kind of answer that needs no analysis: refusal, parse failure, decoding error.
  auto run = [&](int i) {
    const char* dir = captures[i]->dir.path().c_str();
    std::string answers;
    for (int k = 0; k < 20; ++k) {
      answers += answerOf(getAutoAnalysisFrameDetection(dir, "other", nullptr, kFlipParas));
      answers += answerOf(getUpdateBandDetection(dir, "{\"a\": ", "chemi", nullptr, kFlipParas));
      answers += answerOf(getBandLaneAnalysis(dir, kFrame, "chemi", nullptr,
                                              R"({"ImageParas": [{"r": "red"}]})"));
    }
    return answers;
  };
  StdoutCapture out;
  std::vector<std::string> serial;
  for (int i = 0; i < 4; ++i) serial.push_back(run(i));
  std::vector<std::string> parallel(4);
  std::vector<std::thread> threads;
  for (int i = 0; i < 4; ++i) threads.emplace_back([&, i] { parallel[i] = run(i); });
  for (std::thread& t : threads) t.join();
  out.finish();
  EXPECT_EQ(parallel, serial);
  EXPECT_EQ(serial[0].substr(0, 17), "<null><null>error");
  for (const auto& c : captures) EXPECT_TRUE(c->untouched());
}

TEST(VitToTiff, ConvertsAndReportsWhetherAFileWasWritten) {
  TempDir dir;
  cv::Mat deep(20, 30, CV_16UC1);
  cv::randu(deep, 0, 65535);
  test::writeImage(dir.file("deep.png"), deep);
  cv::Mat colour(10, 10, CV_8UC3, cv::Scalar(10, 200, 60));
  test::writeImage(dir.file("colour.png"), colour);

  StdoutCapture out;
  EXPECT_EQ(vitToTiff(dir.file("deep.png").c_str(), dir.file("deep.tif").c_str()), 1);
  const cv::Mat back = cv::imread(dir.file("deep.tif"), cv::IMREAD_UNCHANGED);
  ASSERT_EQ(back.type(), CV_16UC1);
  EXPECT_EQ(cv::norm(back, deep, cv::NORM_INF), 0.0);

  EXPECT_EQ(vitToTiff(dir.file("colour.png").c_str(), dir.file("colour.tif").c_str()), 1);
  EXPECT_EQ(cv::imread(dir.file("colour.tif"), cv::IMREAD_UNCHANGED).type(), CV_8UC1);

  // Missing source, unknown target format, target in a missing folder: nothing written.
  EXPECT_EQ(vitToTiff(dir.file("missing.png").c_str(), dir.file("missing.tif").c_str()), -1);
  EXPECT_EQ(vitToTiff(dir.file("deep.png").c_str(), dir.file("deep.unknownext").c_str()), -1);
  EXPECT_EQ(vitToTiff(dir.file("deep.png").c_str(), dir.file("no/such/dir/x.tif").c_str()), -1);
  const std::string log = out.finish();
  EXPECT_NE(log.find("Exception converting image to TIFF format: "), std::string::npos);
  EXPECT_FALSE(fs::exists(dir.file("missing.tif")));
  EXPECT_FALSE(fs::exists(dir.file("deep.unknownext")));
}

}  // namespace
}  // namespace viraduve
