#include <gtest/gtest.h>

#include <sys/stat.h>

#include <algorithm>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <functional>
#include <stdexcept>
#include <string>
#include <vector>

#include <opencv2/imgcodecs.hpp>

#include "api/call_frame.h"
#include "test_support.h"
#include "viraduve/Exception.h"

namespace viraduve {
namespace api {
namespace {

namespace fs = std::filesystem;
using test::StdoutCapture;
using test::TempDir;

std::vector<std::string> folderEntries(const std::string& dir) {
  std::vector<std::string> names;
  for (const auto& e : fs::directory_iterator(dir)) names.push_back(e.path().filename().string());
  std::sort(names.begin(), names.end());
  return names;
}

// A small 16-bit picture whose every pixel is distinct, so any mirror shows.
cv::Mat gradient(int rows, int cols) {
  cv::Mat m(rows, cols, CV_16UC1);
  for (int r = 0; r < rows; ++r) {
    for (int c = 0; c < cols; ++c) m.at<ushort>(r, c) = static_cast<ushort>(1000 + r * 100 + c);
  }
  return m;
}

bool sameMat(const cv::Mat& a, const cv::Mat& b) {
  return a.size() == b.size() && a.type() == b.type() && cv::norm(a, b, cv::NORM_INF) == 0.0;
}

TEST(CallFrame, TextArgReadsNullAsEmpty) {
  EXPECT_EQ(textArg(nullptr), "");
  EXPECT_EQ(textArg("chemi"), "chemi");
}

TEST(CallFrame, ParseJsonLogsFailureLineAndReaderMessages) {
  Json::Value root;
  StdoutCapture out;
  EXPECT_FALSE(parseJson("{", root, "Failed to parse analysis Frame"));
  EXPECT_EQ(out.finish(),
            "Failed to parse analysis Frame\n* Line 1, Column 2\n"
            "  Missing '}' or object member name\n");

  StdoutCapture quiet;
  EXPECT_TRUE(parseJson("// comment\n{\"a\": [1, 2]}", root, "unused"));
  EXPECT_EQ(quiet.finish(), "");
  EXPECT_EQ(root["a"][1].asInt(), 2);
}

TEST(CallFrame, DeepNestingIsRefusedWithoutExhaustingTheStack) {
  Json::Value root;
  // The reader stops at its nesting limit with its own error; the boundary turns it into
  // the "error" answer.
  EXPECT_THROW(parseJson(std::string(200000, '['), root, "x"), std::exception);
  StdoutCapture out;
  EXPECT_FALSE(parseJson(std::string(200000, '{'), root, "Failed"));
  EXPECT_EQ(out.finish().rfind("Failed\n", 0), 0u);
}

TEST(CallFrame, AnswerTextIsAZeroTerminatedMallocCopy) {
  const std::string text("{\"a\": 1}");
  char* block = answerText(text);
  ASSERT_NE(block, nullptr);
  EXPECT_STREQ(block, text.c_str());
  std::free(block);
  char* empty = answerText("");
  EXPECT_EQ(empty[0], '\0');
  std::free(empty);
}

TEST(CallFrame, GuardAnswersAndLogs) {
  const struct {
    std::function<char*()> body;
    const char* log;
  } cases[] = {
      {[]() -> char* { throw std::runtime_error("boom"); },
       "boom\nERROR in __FUNCTION__ = getBandLaneAnalysis\n"},
      {[]() -> char* { throw Exception(-4, "bad", "f", "DaduZerovoVur\\X", 12); },
       "dadodazeda Error: bad (code: -4) in the function f of file DaduZerovoVur\\X at line "
       "12\nERROR in __FUNCTION__ = getBandLaneAnalysis\n"},
      {[]() -> char* { throw 42; }, "ERROR in __FUNCTION__ = getBandLaneAnalysis\n"},
      {[]() -> char* {
         const Json::Value v(5);
         return const_cast<char*>(v["key"].asCString());
       },
       nullptr},
  };
  for (const auto& c : cases) {
    StdoutCapture out;
    char* answer = guardTextCall("getBandLaneAnalysis", c.body);
    const std::string log = out.finish();
    EXPECT_EQ(answer, kErrorAnswer);
    EXPECT_STREQ(answer, "error");
    if (c.log) {
      EXPECT_EQ(log, c.log);
    } else {
      EXPECT_NE(log.find("requires objectValue or nullValue\nERROR in __FUNCTION__"),
                std::string::npos)
          << log;
    }
  }

  StdoutCapture out;
  EXPECT_EQ(guardTextCall("f", [] { return static_cast<char*>(nullptr); }), nullptr);
  char* ok = guardTextCall("f", [] { return answerText("{}"); });
  EXPECT_STREQ(ok, "{}");
  std::free(ok);
  EXPECT_EQ(out.finish(), "");
}

TEST(CallFrame, GuardStatusCall) {
  StdoutCapture out;
  EXPECT_EQ(guardStatusCall("convertAndExportImage", -1, [] { return 0; }), 0);
  EXPECT_EQ(guardStatusCall("convertAndExportImage", -1,
                            []() -> int { throw std::logic_error("bad export"); }),
            -1);
  EXPECT_EQ(out.finish(), "bad export\nERROR in __FUNCTION__ = convertAndExportImage\n");
}

TEST(ApplyChannelGeometry, BakesFlipsAndRotationIntoTheFilesAndClearsThem) {
  TempDir dir;
  const cv::Mat picture = gradient(6, 8);
  for (const char* name : {"ch0.tif", "ch1.tif", "ch2.tif", "ch10.tif"}) {
    test::writeImage(dir.file(name), picture);
  }
  // Files pair with parameters in byte-wise name order: ch0, ch1, ch10, ch2.
  std::vector<ImageParam> params(4);
  params[0].img_flip_h = true;
  params[1].img_flip_v = true;
  params[2].img_flip_h = true;  // ch10
  params[2].img_flip_v = true;
  params[3].img_angle = 0.0005;  // below the rotation's threshold: nothing to do
  struct stat before {};
  ASSERT_EQ(stat(dir.file("ch2.tif").c_str(), &before), 0);

  StdoutCapture out;
  applyChannelGeometry(dir.path(), params);
  out.finish();

  cv::Mat h, v, hv;
  cv::flip(picture, h, 1);
  cv::flip(picture, v, 0);
  cv::flip(picture, hv, -1);
  EXPECT_TRUE(sameMat(cv::imread(dir.file("ch0.tif"), cv::IMREAD_ANYDEPTH), h));
  EXPECT_TRUE(sameMat(cv::imread(dir.file("ch1.tif"), cv::IMREAD_ANYDEPTH), v));
  EXPECT_TRUE(sameMat(cv::imread(dir.file("ch10.tif"), cv::IMREAD_ANYDEPTH), hv));
  // The untouched channel was not rewritten at all.
  struct stat after {};
  ASSERT_EQ(stat(dir.file("ch2.tif").c_str(), &after), 0);
  EXPECT_EQ(after.st_ino, before.st_ino);
  EXPECT_EQ(after.st_mtim.tv_nsec, before.st_mtim.tv_nsec);
  EXPECT_EQ(after.st_mtim.tv_sec, before.st_mtim.tv_sec);

  for (const ImageParam& p : params) {
    EXPECT_EQ(p.img_angle, 0.0);
    EXPECT_FALSE(p.img_flip_h || p.img_flip_v);
  }
  EXPECT_EQ(folderEntries(dir.path()),
            (std::vector<std::string>{"ch0.tif", "ch1.tif", "ch10.tif", "ch2.tif"}));
}

TEST(ApplyChannelGeometry, RotationWritesTheRotatedPicture) {
  TempDir dir;
  test::writeImage(dir.file("ch0.tif"), cv::Mat(40, 60, CV_16UC1, cv::Scalar(30000)));
  std::vector<ImageParam> params(1);
  params[0].img_angle = 45.0;
  StdoutCapture out;
  applyChannelGeometry(dir.path(), params);
  out.finish();
  const cv::Mat rotated = cv::imread(dir.file("ch0.tif"), cv::IMREAD_ANYDEPTH);
  ASSERT_EQ(rotated.type(), CV_16UC1);
  EXPECT_GT(rotated.cols, 60);
  // The uncovered corners are filled with 0.
  EXPECT_EQ(rotated.at<ushort>(0, 0), 0);
  EXPECT_EQ(rotated.at<ushort>(rotated.rows / 2, rotated.cols / 2), 30000);
}

TEST(ApplyChannelGeometry, NothingToDoAndMismatches) {
  TempDir empty;
  std::vector<ImageParam> params(2);
  params[0].img_flip_h = true;
  applyChannelGeometry(empty.path(), params);  // no channel files
  EXPECT_FALSE(params[0].img_flip_h);

  TempDir dir;
  test::writeImage(dir.file("ch0.tif"), gradient(4, 4));
  test::writeImage(dir.file("ch1.tif"), gradient(4, 4));
  std::vector<ImageParam> one(1);
  StdoutCapture out;
  EXPECT_THROW(applyChannelGeometry(dir.path(), one), std::out_of_range);
}

TEST(ApplyChannelGeometry, FailedWriteKeepsTheOriginalAndLeavesNoTemporaryFile) {
  TempDir dir;
  // A name so long that no temporary name beside it is possible.
  const std::string name = "ch0" + std::string(240, 'a') + ".tif";
  const cv::Mat picture = gradient(5, 7);
  test::writeImage(dir.file(name), picture);
  const auto bytes = test::readBytes(dir.file(name));
  std::vector<ImageParam> params(1);
  params[0].img_flip_h = true;
  StdoutCapture out;
  EXPECT_THROW(applyChannelGeometry(dir.path(), params), std::runtime_error);
  out.finish();
  EXPECT_EQ(test::readBytes(dir.file(name)), bytes);
  EXPECT_EQ(folderEntries(dir.path()), std::vector<std::string>{name});
}

TEST(WriteImageAtomically, ReplacesContentKeepsModeAndCleansUpOnFailure) {
  TempDir dir;
  const std::string path = dir.file("ch0.tif");
  test::writeImage(path, gradient(3, 3));
  ASSERT_EQ(chmod(path.c_str(), 0644), 0);
  const cv::Mat replacement = gradient(5, 2);
  writeImageAtomically(path, replacement);
  EXPECT_TRUE(sameMat(cv::imread(path, cv::IMREAD_ANYDEPTH), replacement));
  struct stat st {};
  ASSERT_EQ(stat(path.c_str(), &st), 0);
  EXPECT_EQ(st.st_mode & 0777, 0644u);

  const auto bytes = test::readBytes(path);
  // OpenCV refuses to encode an empty picture.
  EXPECT_ANY_THROW(writeImageAtomically(path, cv::Mat()));
  // A directory where the file should go: the rename fails.
  fs::create_directory(dir.file("ch1.tif"));
  fs::create_directory(dir.file("ch1.tif/inner"));
  EXPECT_ANY_THROW(writeImageAtomically(dir.file("ch1.tif"), replacement));
  EXPECT_EQ(test::readBytes(path), bytes);
  EXPECT_EQ(folderEntries(dir.path()), (std::vector<std::string>{"ch0.tif", "ch1.tif"}));
}

}  // namespace
}  // namespace api
}  // namespace viraduve
