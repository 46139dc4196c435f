// Calls on different captures from several threads at once must answer exactly what the same
// calls answer one after the other: no call may see another's parser, images or results.
#include <gtest/gtest.h>
#include <fcntl.h>
#include <unistd.h>

#include <cstdio>
#include <functional>
#include <iostream>
#include <sstream>
#include <string>
#include <thread>
#include <vector>

#include <json/json.h>

#include "synth.h"
#include "test_support.h"
#include "viraduve/viraduve.h"

namespace viraduve {
namespace {

using test::TempDir;

constexpr int kThreads = 8;
constexpr int kCallsPerThread = 25;

// The library logs every step; hundreds of calls would flood the test output.
class QuietStdout {
 public:
  QuietStdout() {
    std::cout.flush();
    std::fflush(stdout);
    saved_ = dup(STDOUT_FILENO);
    const int null = open("/dev/null", O_WRONLY);
    dup2(null, STDOUT_FILENO);
    close(null);
  }
  ~QuietStdout() {
    std::cout.flush();
    std::fflush(stdout);
    dup2(saved_, STDOUT_FILENO);
    close(saved_);
  }

 private:
  int saved_ = -1;
};

std::string takeAnswer(char* answer) {
  if (answer == nullptr) return "<null>";
  const std::string text(answer);
  releaseResult(answer);
  return text;
}

std::string toText(const Json::Value& v) {
  Json::StreamWriterBuilder builder;
  return Json::writeString(builder, v);
}

// One capture per thread, each of its own seed and lane count, with a request of every kind.
struct Workload {
  TempDir dir;
  std::string frame, paras, regions, bg, tpn;
  std::vector<std::function<std::string()>> calls;

  explicit Workload(int index) {
    const synth::Truth truth =
        synth::writeCapture(synth::cleanGel(140 + 8 * index, 110, 2 + index % 3, 2, 100 + index), dir.path());
    frame = synth::truthFrameJson(truth, 0);
    paras = synth::imageParasJson(1);
    Json::Value doc;
    std::istringstream(frame) >> doc;
    const Json::Value& f = doc["analysisFrame"];
    Json::Value t;
    Json::Value& entry = t["frameList"][0];
    for (const char* k : {"x1", "x2", "y1", "y2"}) entry["analysisFrameRoi"][k] = f[k];
    entry["channel"] = 0;
    for (Json::ArrayIndex j = 0; j < f["roiList"].size(); ++j) {
      Json::Value named;
      named["laneVolTop"]["y1"] = f["y1"];
      named["laneVolBottom"]["y2"] = f["y2"];
      for (const char* k : {"x1", "x2", "y1", "y2"}) named["laneRoi"][k] = f["roiList"][j]["lane"][k];
      entry["normalizeLanes"].append(named);
    }
    tpn = toText(t);
    regions = R"({"region_list": [{"circle_b": false, "channel": 0, "x1": 20, "y1": 20, "x2": 50, "y2": 40},)"
              R"( {"circle_b": true, "channel": 0, "x": 70, "y": 60, "circle_radius": 9}]})";
    bg = R"({"bgRegion": {"circle_b": true, "x": 10, "y": 100, "circle_radius": 6}})";

    const char* d = dir.path().c_str();
    calls = {
        [=] { return takeAnswer(getAutoAnalysisFrameDetection(d, "uv", nullptr, paras.c_str())); },
        [=] { return takeAnswer(getBandLaneAnalysis(d, frame.c_str(), "uv", nullptr, paras.c_str())); },
        [=] { return takeAnswer(getCustomAnalysisFrame(d, frame.c_str(), "uv", nullptr, paras.c_str())); },
        [=] { return takeAnswer(getUpdateBandDetection(d, frame.c_str(), "uv", nullptr, paras.c_str())); },
        [=] { return takeAnswer(getRollingBallOnAnalysedData(d, frame.c_str(), "uv", nullptr, paras.c_str())); },
        [=] {
          return takeAnswer(getRegionAnalysis(d, regions.c_str(), "uv", nullptr, paras.c_str(), bg.c_str()));
        },
        [=] { return takeAnswer(getTPNAnalysisData(d, frame.c_str(), "protein", tpn.c_str(), paras.c_str())); },
        // A refused request on the same parser path.
        [=] { return takeAnswer(getBandLaneAnalysis(d, "{", "uv", nullptr, paras.c_str())); },
    };
  }
};

TEST(Concurrency, ThreadsOnTheirOwnCapturesAnswerAsASerialRunDoes) {
  std::vector<std::unique_ptr<Workload>> work;
  for (int i = 0; i < kThreads; ++i) work.push_back(std::make_unique<Workload>(i));

  std::vector<std::vector<std::string>> expected(kThreads);
  std::vector<std::vector<std::string>> got(kThreads, std::vector<std::string>(kCallsPerThread));
  {
    QuietStdout quiet;
    for (int i = 0; i < kThreads; ++i) {
      for (const auto& call : work[i]->calls) expected[i].push_back(call());
    }
    std::vector<std::thread> threads;
    for (int i = 0; i < kThreads; ++i) {
      threads.emplace_back([&, i] {
        const std::size_t kinds = work[i]->calls.size();
        // Each thread starts at another kind of call, so that different kinds overlap.
        for (int n = 0; n < kCallsPerThread; ++n) got[i][n] = work[i]->calls[(i + n) % kinds]();
      });
    }
    for (std::thread& t : threads) t.join();
  }

  for (int i = 0; i < kThreads; ++i) {
    for (const std::string& answer : expected[i]) {
      ASSERT_NE(answer, "error") << "capture " << i << ": the serial run failed";
    }
    const std::size_t kinds = work[i]->calls.size();
    for (int n = 0; n < kCallsPerThread; ++n) {
      const std::size_t kind = (i + n) % kinds;
      EXPECT_EQ(got[i][n], expected[i][kind]) << "thread " << i << ", call " << n << " (kind " << kind << ")";
    }
  }
}

}  // namespace
}  // namespace viraduve
