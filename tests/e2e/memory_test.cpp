// Memory: repeated analyses hold nothing between them, and the peak of one call of each text
// entry point and of the export stays within a small multiple of the capture's pixel data.
#include <gtest/gtest.h>
#include <fcntl.h>
#include <malloc.h>
#include <unistd.h>

#include <cstdio>
#include <cstdlib>
#include <fstream>
#include <iostream>
#include <string>

#include "synth.h"
#include "test_support.h"
#include "viraduve/viraduve.h"

#if defined(__SANITIZE_ADDRESS__) || defined(__SANITIZE_THREAD__)
#define VIRADUVE_SANITIZED 1
#elif defined(__has_feature)
#if __has_feature(address_sanitizer) || __has_feature(thread_sanitizer)
#define VIRADUVE_SANITIZED 1
#endif
#endif

namespace viraduve {
namespace {

using test::TempDir;

constexpr double kMiB = 1024.0 * 1024.0;

// Resident memory now, from /proc/self/statm (second field, in pages).
double residentBytes() {
  std::ifstream statm("/proc/self/statm");
  long size = 0;
  long resident = 0;
  statm >> size >> resident;
  return static_cast<double>(resident) * static_cast<double>(sysconf(_SC_PAGESIZE));
}

// The largest resident size since the last resetPeak() (VmHWM of /proc/self/status, in KiB).
// getrusage's ru_maxrss would also count the pages of the process this child was forked from.
double peakResidentBytes() {
  std::ifstream status("/proc/self/status");
  std::string line;
  while (std::getline(status, line)) {
    if (line.rfind("VmHWM:", 0) == 0) return std::stod(line.substr(6)) * 1024.0;
  }
  return -1.0;
}

// Lowers the high-water mark to the present resident size.
bool resetPeak() {
  std::ofstream clear("/proc/self/clear_refs");
  clear << "5";
  clear.flush();
  return static_cast<bool>(clear);
}

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

enum class Call { BandLane, Custom, Update, Auto, RollingBall, Region, Tpn, Export };

struct Capture {
  TempDir dir;
  int channels;
  std::string frame, frameList, paras, regions, tpn;

  Capture(int width, int height, int channelCount) : channels(channelCount) {
    synth::CaptureSpec plan = synth::cleanGel(width, height, 6, 4, 3);
    plan.channels = channels;
    const synth::Truth truth = synth::writeCapture(plan, dir.path());
    frame = synth::truthFrameJson(truth, 0);
    frameList = "[" + frame + "]";
    paras = synth::imageParasJson(channels);
    regions = "{\"region_list\": [{\"circle_b\": false, \"channel\": 0, \"x1\": 10, \"y1\": 10, "
              "\"x2\": " + std::to_string(width / 3) + ", \"y2\": " + std::to_string(height / 3) +
              "}, {\"circle_b\": true, \"channel\": 0, \"x\": " + std::to_string(width / 2) +
              ", \"y\": " + std::to_string(height / 2) + ", \"circle_radius\": 40}]}";
    const synth::TruthFrame& f = truth.frames.at(0);
    tpn = "{\"frameList\": [{\"analysisFrameRoi\": {\"x1\": " + std::to_string(f.x1) +
          ", \"x2\": " + std::to_string(f.x2) + ", \"y1\": " + std::to_string(f.y1) +
          ", \"y2\": " + std::to_string(f.y2) + "}, \"channel\": 0, \"normalizeLanes\": []}]}";
  }

  const char* mode() const { return channels == 1 ? "uv" : "chemi"; }

  bool run(Call call) const {
    const char* d = dir.path().c_str();
    if (call == Call::Export) {
      std::string overlay = "{\"overlayList\": [0";
      for (int c = 1; c < channels; ++c) overlay += ", " + std::to_string(c);
      overlay += "]}";
      const char* attributes =
          "{\"exportAttribute\": {\"exportLayers\": true, \"format\": 1, \"channelSelection\": 1, "
          "\"dpi\": 254, \"height\": 20.0, \"width\": 20.0}}";
      return convertAndExportImage(d, frameList.c_str(), regions.c_str(), mode(), nullptr, attributes,
                                   paras.c_str(), overlay.c_str(), "{}", 0, "[]", "{}", "[]",
                                   "Windows_NT") == 0;
    }
    char* answer = nullptr;
    switch (call) {
      case Call::BandLane: answer = getBandLaneAnalysis(d, frame.c_str(), mode(), nullptr, paras.c_str()); break;
      case Call::Custom: answer = getCustomAnalysisFrame(d, frame.c_str(), mode(), nullptr, paras.c_str()); break;
      case Call::Update: answer = getUpdateBandDetection(d, frame.c_str(), mode(), nullptr, paras.c_str()); break;
      case Call::Auto: answer = getAutoAnalysisFrameDetection(d, mode(), nullptr, paras.c_str()); break;
      case Call::RollingBall:
        answer = getRollingBallOnAnalysedData(d, frame.c_str(), mode(), nullptr, paras.c_str());
        break;
      case Call::Region:
        answer = getRegionAnalysis(d, regions.c_str(), mode(), nullptr, paras.c_str(), nullptr);
        break;
      case Call::Tpn: answer = getTPNAnalysisData(d, frame.c_str(), mode(), tpn.c_str(), paras.c_str()); break;
      case Call::Export: break;
    }
    const bool ok = answer != nullptr && std::string(answer) != "error";
    releaseResult(answer);
    return ok;
  }
};

TEST(Memory, RepeatedAnalysesKeepResidentMemoryFlat) {
#ifdef VIRADUVE_SANITIZED
  GTEST_SKIP() << "the sanitizers' own bookkeeping grows the resident set; leaks are theirs to find";
#endif
  // 1.2 MB of pixels per call: a call that kept its images would add 240 MB over the run.
  const Capture capture(800, 750, 1);
  int failures = 0;
  double growth = 0.0;
  {
    QuietStdout quiet;
    for (int i = 0; i < 10; ++i) failures += capture.run(Call::BandLane) ? 0 : 1;  // allocator pools settle
    const double before = residentBytes();
    for (int i = 0; i < 200; ++i) failures += capture.run(Call::BandLane) ? 0 : 1;
    growth = residentBytes() - before;
  }
  EXPECT_EQ(failures, 0);
  EXPECT_LT(growth, 50 * kMiB) << "resident memory grew by " << growth / kMiB << " MiB";
}

struct PeakCase {
  const char* name;
  Call call;
  double maxMultiple;  // of the capture's pixel data
};

// Run in a child process of its own, so that nothing else shares the measured peak.
void measurePeakAndExit(const PeakCase& c, int width, int height, int channels) {
  const Capture capture(width, height, channels);
  const double pixelBytes = 2.0 * width * height * channels;  // 16-bit samples
  bool ok = false;
  double added = 0.0;
  {
    QuietStdout quiet;
    // Memory freed since the capture was written goes back to the system first, so that
    // the call cannot reuse it unseen.
    malloc_trim(0);
    if (!resetPeak()) {
      std::cerr << "cannot reset the peak resident size\n";
      std::exit(2);
    }
    const double base = residentBytes();
    ok = capture.run(c.call);
    added = peakResidentBytes() - base;
  }
  std::cerr << c.name << (ok ? "" : " failed;") << " peak added by the call: " << added / kMiB
            << " MiB for " << pixelBytes / kMiB << " MiB of pixels (" << added / pixelBytes
            << " times)\n";
  std::exit(ok && added <= c.maxMultiple * pixelBytes ? 0 : 1);
}

class Peak : public ::testing::TestWithParam<PeakCase> {};

TEST_P(Peak, OfOneCallIsASmallMultipleOfItsPixels) {
#ifdef VIRADUVE_SANITIZED
  GTEST_SKIP() << "the sanitizers' shadow memory and quarantine inflate the peak";
#endif
  GTEST_FLAG_SET(death_test_style, "threadsafe");
  // Two 4-megapixel channels: 16 MB of pixels.
  EXPECT_EXIT(measurePeakAndExit(GetParam(), 2000, 2000, 2), ::testing::ExitedWithCode(0), "peak added");
}

// Bounds about twice the measured peaks (docs/performance.md, "Memory"). Measuring decodes
// every channel and then works on one channel at a time in single precision; detection adds
// the composed detection image with its smoothed and gradient copies; the export holds
// 3-component 16-bit pictures.
INSTANTIATE_TEST_SUITE_P(Memory, Peak,
                         ::testing::Values(PeakCase{"BandLane", Call::BandLane, 8.0},
                                           PeakCase{"RollingBall", Call::RollingBall, 10.0},
                                           PeakCase{"Region", Call::Region, 10.0},
                                           PeakCase{"Tpn", Call::Tpn, 6.0},
                                           PeakCase{"Update", Call::Update, 26.0},
                                           PeakCase{"Custom", Call::Custom, 28.0},
                                           PeakCase{"Auto", Call::Auto, 28.0},
                                           PeakCase{"Export", Call::Export, 16.0}),
                         [](const ::testing::TestParamInfo<PeakCase>& info) { return std::string(info.param.name); });

}  // namespace
}  // namespace viraduve
