// Shared helpers for the tests: temporary folders, 16-bit TIFF files, captured output.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include <opencv2/core.hpp>

namespace viraduve {
namespace test {

// A fresh folder under the system temporary folder, removed with its content at the end.
class TempDir {
 public:
  TempDir();
  ~TempDir();
  TempDir(const TempDir&) = delete;
  TempDir& operator=(const TempDir&) = delete;
  const std::string& path() const { return path_; }
  std::string file(const std::string& name) const { return path_ + "/" + name; }

 private:
  std::string path_;
};

// Writes a CV_16UC1 (or any) matrix with cv::imwrite; fails the test when it cannot.
void writeImage(const std::string& path, const cv::Mat& image);
// The bytes of a file (empty when missing).
std::vector<unsigned char> readBytes(const std::string& path);
// The real gel captures shipped in tests/data/gels.
std::string dataDir();

// Captures what the code under test writes to standard output (the library's log).
class StdoutCapture {
 public:
  StdoutCapture();
  ~StdoutCapture();
  // Stops capturing (once) and returns the text.
  std::string finish();

 private:
  int savedFd_ = -1;
  std::string file_;
  bool done_ = false;
  std::string text_;
};

}  // namespace test
}  // namespace viraduve
