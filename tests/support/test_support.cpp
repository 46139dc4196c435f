#include "test_support.h"

#include <unistd.h>

#include <cstdio>
#include <filesystem>
#include <fstream>
#include <iostream>
#include <iterator>
#include <random>
#include <sstream>

#include <gtest/gtest.h>
#include <opencv2/imgcodecs.hpp>

namespace viraduve {
namespace test {

TempDir::TempDir() {
  namespace fs = std::filesystem;
  std::random_device rd;
  for (;;) {
    std::ostringstream name;
    name << "viraduve-test-" << std::hex << rd() << rd();
    fs::path p = fs::temp_directory_path() / name.str();
    if (fs::create_directory(p)) {
      path_ = p.string();
      break;
    }
  }
}

TempDir::~TempDir() {
  std::error_code ec;
  std::filesystem::remove_all(path_, ec);
}

void writeImage(const std::string& path, const cv::Mat& image) {
  ASSERT_TRUE(cv::imwrite(path, image)) << path;
}

std::vector<unsigned char> readBytes(const std::string& path) {
  std::ifstream in(path, std::ios::binary);
  return std::vector<unsigned char>(std::istreambuf_iterator<char>(in), {});
}

std::string dataDir() { return VIRADUVE_TEST_DATA_DIR; }

StdoutCapture::StdoutCapture() {
  std::cout.flush();
  std::fflush(stdout);
  char name[] = "/tmp/viraduve-stdout-XXXXXX";
  const int fd = mkstemp(name);
  file_ = name;
  savedFd_ = dup(STDOUT_FILENO);
  dup2(fd, STDOUT_FILENO);
  close(fd);
}

StdoutCapture::~StdoutCapture() { finish(); }

std::string StdoutCapture::finish() {
  if (done_) return text_;
  done_ = true;
  std::cout.flush();
  std::fflush(stdout);
  dup2(savedFd_, STDOUT_FILENO);
  close(savedFd_);
  std::ifstream in(file_, std::ios::binary);
  text_.assign(std::istreambuf_iterator<char>(in), {});
  std::remove(file_.c_str());
  return text_;
}

}  // namespace test
}  // namespace viraduve
