// Export of a large two-channel capture at 10 x 10 cm and 300 dpi as PNG, against the work no
// implementation can skip: decoding the channel files, resizing them to the print size and
// encoding the PNG files.
#include <stdlib.h>

#include <cstdio>
#include <filesystem>
#include <string>

#include <opencv2/imgcodecs.hpp>
#include <opencv2/imgproc.hpp>

#include "bench.h"
#include "synth.h"
#include "viraduve/viraduve.h"

namespace {

struct ExportCapture {
  std::string dir;
  std::string frames;
  std::string paras;
  ExportCapture() {
    char name[] = "/tmp/viraduve-bench-XXXXXX";
    dir = mkdtemp(name);
    viraduve::synth::CaptureSpec plan = viraduve::synth::cleanGel(2048, 2048, 10, 6, 23);
    plan.channels = 2;
    const viraduve::synth::Truth truth = viraduve::synth::writeCapture(plan, dir);
    frames = "[" + viraduve::synth::truthFrameJson(truth, 0) + "]";
    paras = viraduve::synth::imageParasJson(2);
  }
  ~ExportCapture() {
    std::error_code ec;
    std::filesystem::remove_all(dir, ec);
  }

  void run(int channelSelection) const {
    const std::string attributes =
        "{\"exportAttribute\": {\"exportLayers\": true, \"format\": 1, \"channelSelection\": " +
        std::to_string(channelSelection) +
        ", \"dpi\": 300, \"height\": 10.0, \"width\": 10.0, \"exportAnnotation\": false, "
        "\"exportMarkers\": false}}";
    const int status = convertAndExportImage(
        dir.c_str(), frames.c_str(), "{\"region_list\": []}", "fluo", nullptr, attributes.c_str(),
        paras.c_str(), "{\"overlayList\": [0, 1]}", "{}", 0, "[]", "{\"mwMarkerFrame\": []}", "[]",
        "Linux");
    if (status != 0) std::fprintf(stderr, "export failed: %d\n", status);
  }
};

void unavoidable(const std::string& dir) {
  for (const char* file : {"ch0", "ch1"}) {
    const cv::Mat raw = cv::imread(dir + "/" + file + ".tif", cv::IMREAD_UNCHANGED);
    cv::Mat small;
    cv::resize(raw, small, cv::Size(1181, 1181), 0, 0, cv::INTER_LINEAR);
    cv::Mat colour;
    small.convertTo(small, CV_8U, 1.0 / 255);
    cv::cvtColor(small, colour, cv::COLOR_GRAY2BGR);
    cv::imwrite(dir + "/" + file + "-base.png", colour);
  }
}

}  // namespace

VIRADUVE_BENCH(exportTwoChannelsAtPrintSize) {
  const ExportCapture capture;
  const double base = bench::medianSeconds(3, [&] { unavoidable(capture.dir); });
  bench::report("export: decode 2 x 2048^2 TIFF, resize to 1181^2, write 2 PNG", base);

  char note[64];
  const double channels = bench::medianSeconds(3, [&] { capture.run(2); });
  std::snprintf(note, sizeof note, "%.2f x the unavoidable work", channels / base);
  bench::report("export: 2 channel PNGs with layers, 10 x 10 cm at 300 dpi", channels, note);

  const double merged = bench::medianSeconds(3, [&] { capture.run(1); });
  std::snprintf(note, sizeof note, "%.2f x the unavoidable work", merged / base);
  bench::report("export: merged PNG with layers, 10 x 10 cm at 300 dpi", merged, note);
}
