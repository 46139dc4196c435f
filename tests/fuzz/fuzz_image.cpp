// Channel images from arbitrary bytes: decoding, the greyscale view, mirroring, inversion and
// rotation, and loading from a file. Run it with OPENCV_IO_MAX_IMAGE_PIXELS set (as
// scripts/run-fuzzers.sh does), or a forged header makes the decoder ask for gigabytes.
#include <unistd.h>

#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <exception>
#include <string>
#include <vector>

#include "viraduve/Image.h"

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  viraduve::Image image;
  image.setEncoded(std::vector<unsigned char>(data, data + size));
  try {
    const cv::Mat& m = image.mat();
    if (!m.empty() && m.total() < (1u << 22)) {
      image.decodeGrey8();
      viraduve::Image copy;
      viraduve::flipChannelImage(image, copy, true, true);
      viraduve::invertChannelImage(copy, copy, 65535);
      // Rotation works on a square of the diagonal; the library refuses squares above 2^31
      // pixels, far beyond the fuzzer's memory limit, so only modest ones are tried here.
      const double squares = static_cast<double>(m.rows) * m.rows + static_cast<double>(m.cols) * m.cols;
      if (squares <= (1 << 23)) {
        viraduve::rotateChannelImage(copy, copy, 17.5f, static_cast<int>(size % 3) - 1);
      }
    }
  } catch (const std::exception&) {
  }
  static const std::string path = "/tmp/viraduve-fuzz-" + std::to_string(getpid()) + ".tif";
  if (FILE* f = std::fopen(path.c_str(), "wb")) {
    std::fwrite(data, 1, size, f);
    std::fclose(f);
    try {
      viraduve::Image loaded;
      loaded._load(path);
    } catch (const std::exception&) {
    }
    std::remove(path.c_str());
  }
  return 0;
}
