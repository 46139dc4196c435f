// The text entry points on a small fixed capture with fuzzed JSON arguments. The input is
// split at byte 0x01 into the image parameters, the frame (or regions) and a third text.
#include <unistd.h>

#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <filesystem>
#include <string>
#include <vector>

#include <opencv2/core.hpp>
#include <opencv2/imgcodecs.hpp>
#include <opencv2/imgproc.hpp>

#include "viraduve/viraduve.h"

namespace {

std::string capturePath() { return "/tmp/viraduve-fuzz-capture-" + std::to_string(getpid()); }

// Created on first use, removed when the fuzzer exits.
const std::string& captureDir() {
  static const std::string dir = [] {
    std::string d = capturePath();
    std::filesystem::create_directories(d);
    std::atexit([] { std::filesystem::remove_all(capturePath()); });
    return d;
  }();
  return dir;
}

// Rewritten for every input: a call may straighten (rewrite) the channel files.
void writeCapture() {
  for (int c = 0; c < 2; ++c) {
    cv::Mat m(40, 48, CV_16UC1, cv::Scalar(2000 + 1000 * c));
    cv::rectangle(m, cv::Rect(10, 8, 8, 4), cv::Scalar(40000), cv::FILLED);
    cv::rectangle(m, cv::Rect(28, 20, 8, 4), cv::Scalar(30000), cv::FILLED);
    cv::imwrite(captureDir() + "/ch" + std::to_string(c) + ".tif", m);
  }
}

std::vector<std::string> split(const uint8_t* data, size_t size) {
  std::vector<std::string> parts(1);
  for (size_t i = 0; i < size; ++i) {
    if (data[i] == 1 && parts.size() < 3)
      parts.emplace_back();
    else
      parts.back().push_back(static_cast<char>(data[i]));
  }
  parts.resize(3);
  return parts;
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  writeCapture();
  const std::vector<std::string> p = split(data, size);
  const std::string& dir = captureDir();
  const char* modes[] = {"chemi", "uv", "universal"};
  const char* mode = modes[size % 3];
  releaseResult(getBandLaneAnalysis(dir.c_str(), p[1].c_str(), mode, nullptr, p[0].c_str()));
  releaseResult(getCustomAnalysisFrame(dir.c_str(), p[1].c_str(), mode, nullptr, p[0].c_str()));
  releaseResult(getAutoAnalysisFrameDetection(dir.c_str(), mode, nullptr, p[0].c_str()));
  releaseResult(getUpdateBandDetection(dir.c_str(), p[1].c_str(), mode, nullptr, p[0].c_str()));
  releaseResult(
      getRollingBallOnAnalysedData(dir.c_str(), p[1].c_str(), mode, nullptr, p[0].c_str()));
  releaseResult(getRegionAnalysis(dir.c_str(), p[1].c_str(), mode, nullptr, p[0].c_str(),
                                  p[2].empty() ? nullptr : p[2].c_str()));
  releaseResult(getTPNAnalysisData(dir.c_str(), p[1].c_str(), mode, p[2].c_str(), p[0].c_str()));
  return 0;
}
