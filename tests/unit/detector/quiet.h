// Runs detector code with its log captured, so that test failures (also written to standard
// output) stay visible: the capture ends before any assertion runs.
#pragma once

#include <string>
#include <utility>

#include "test_support.h"

namespace viraduve {
namespace test {

template <typename Fn>
std::string logOf(Fn&& fn) {
  StdoutCapture capture;
  std::forward<Fn>(fn)();
  return capture.finish();
}

}  // namespace test
}  // namespace viraduve
