// The call frame of the exported analysis functions: argument texts, parsing, the answers,
// the catch-all at the boundary and the straightening of the channel files.
#include "api/call_frame.h"

#include <stdlib.h>
#include <unistd.h>

#include <cerrno>
#include <cmath>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <exception>
#include <filesystem>
#include <iostream>
#include <new>
#include <stdexcept>
#include <system_error>

#include <opencv2/imgcodecs.hpp>

#include "common/channel_files.h"
#include "common/checked.h"
#include "common/log.h"
#include "viraduve/Image.h"

namespace viraduve {
namespace api {

const char kErrorAnswer[] = "error";

std::string textArg(const char* text) { return text != nullptr ? std::string(text) : std::string(); }

bool parseJson(const std::string& text, Json::Value& root, const char* failureLine) {
  // A reader per call: nothing is shared between concurrent calls.
  Json::Reader reader;
  if (reader.parse(text, root, true)) return true;
  logLine(failureLine);
  // The reader's messages already end each of their lines.
  std::cout << reader.getFormattedErrorMessages() << std::flush;
  return false;
}

char* answerText(const std::string& text) {
  char* block = static_cast<char*>(std::malloc(text.size() + 1));
  if (block == nullptr) throw std::bad_alloc();
  std::memcpy(block, text.data(), text.size());
  block[text.size()] = '\0';
  return block;
}

namespace {

// Logs the active exception (its text when it has one) and the boundary's error line.
void reportFailure(const char* functionName) {
  try {
    throw;
  } catch (const std::exception& e) {
    logLine(e.what());
  } catch (...) {
  }
  // The banner goes through printf; keep it after everything already streamed.
  std::cout.flush();
  std::printf("ERROR in __FUNCTION__ = %s\n", functionName);
  std::fflush(stdout);
}

}  // namespace

char* guardTextCall(const char* functionName, const std::function<char*()>& body) {
  try {
    return body();
  } catch (...) {
    reportFailure(functionName);
    return const_cast<char*>(kErrorAnswer);
  }
}

int guardStatusCall(const char* functionName, int failureStatus,
                    const std::function<int()>& body) {
  try {
    return body();
  } catch (...) {
    reportFailure(functionName);
    return failureStatus;
  }
}

namespace {

bool hasGeometry(const ImageParam& p) {
  // The rotation itself treats smaller angles as none.
  return p.img_flip_h || p.img_flip_v || std::fabs(static_cast<float>(p.img_angle)) >= 0.001f;
}

}  // namespace

void writeImageAtomically(const std::string& path, const cv::Mat& picture) {
  namespace fs = std::filesystem;
  const fs::path target(path);
  // Hidden beside the target, keeping its extension, which selects the encoder.
  std::string temp = (target.parent_path() / ("." + target.filename().string() + ".tmp-XXXXXX" +
                                              target.extension().string()))
                         .string();
  const int suffixLength = static_cast<int>(target.extension().string().size());
  const int fd = mkstemps(&temp[0], suffixLength);
  if (fd < 0) {
    throw std::runtime_error("Cannot create a temporary file beside " + path + ": " +
                             std::strerror(errno));
  }
  close(fd);
  try {
    if (!cv::imwrite(temp, picture)) throw std::runtime_error("Cannot write image file " + path);
    std::error_code ec;
    const fs::file_status original = fs::status(target, ec);
    if (!ec) fs::permissions(temp, original.permissions(), ec);
    fs::rename(temp, target);
  } catch (...) {
    std::error_code ignored;
    fs::remove(temp, ignored);
    throw;
  }
}

void applyChannelGeometry(const std::string& imageDir, std::vector<ImageParam>& params) {
  const std::vector<std::string> names = listChannelFiles(imageDir);
  for (std::size_t i = 0; i < names.size(); ++i) {
    const ImageParam& p = at(params, i);
    // A channel without flips or rotation would be written back unchanged: leave its file
    // (the drivers load and check every channel file anyway).
    if (!hasGeometry(p)) continue;
    Image image(imageDir, names[i]);
    flipChannelImage(image, image, p.img_flip_h, p.img_flip_v);
    rotateChannelImage(image, image, static_cast<float>(p.img_angle), -1);
    writeImageAtomically(joinPath(imageDir, names[i]), image.mat());
  }
  for (ImageParam& p : params) {
    p.img_angle = 0.0;
    p.img_flip_h = false;
    p.img_flip_v = false;
  }
}

}  // namespace api
}  // namespace viraduve
