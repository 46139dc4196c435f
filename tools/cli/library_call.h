// Calling the library from the command line: its log (written to standard output by the
// library) is moved out of the way so that standard output carries only the answer.
#pragma once

#include <functional>
#include <string>

namespace viraduve {
namespace cli {

struct OutputOptions {
  std::string logFile;     // library log into this file
  bool verbose = false;    // library log to standard error
  std::string outFile;     // answer into this file instead of standard output
  bool summary = false;    // readable table instead of JSON
};

// While alive, file descriptor 1 points at the log target (the log file, standard error or
// /dev/null); both the C stdio and the C++ streams are flushed across the switches.
class StdoutRedirect {
 public:
  // Throws UsageError when the log file cannot be opened.
  explicit StdoutRedirect(const OutputOptions& options);
  ~StdoutRedirect();
  StdoutRedirect(const StdoutRedirect&) = delete;
  StdoutRedirect& operator=(const StdoutRedirect&) = delete;
  // Points fd 1 back at the original standard output (once).
  void restore();

 private:
  int saved_ = -1;
};

// Exit statuses.
constexpr int kExitAnswer = 0;
constexpr int kExitError = 1;    // the library answered "error" or failed
constexpr int kExitRefused = 2;  // the library refused the request, or the CLI refused the input

// Runs a text entry point with the log redirected and writes its answer. Returns the exit
// status; refusals and errors print one line on standard error.
int runTextCall(const OutputOptions& options, const std::function<char*()>& call);

// Prints "viraduve: " and the message on standard error.
void reportError(const std::string& message);

}  // namespace cli
}  // namespace viraduve
