#include "library_call.h"

#include <fcntl.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <cstring>
#include <fstream>
#include <iostream>
#include <memory>

#include <viraduve/viraduve.h>

#include "documents.h"
#include "summary.h"

namespace viraduve {
namespace cli {

namespace {

void flushAll() {
  std::cout.flush();
  std::fflush(stdout);
}

int openLogTarget(const OutputOptions& options) {
  int fd;
  if (!options.logFile.empty()) {
    fd = ::open(options.logFile.c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC, 0644);
    if (fd < 0)
      throw UsageError("cannot open log file " + options.logFile + ": " + std::strerror(errno));
  } else if (options.verbose) {
    fd = ::fcntl(2, F_DUPFD_CLOEXEC, 0);
  } else {
    fd = ::open("/dev/null", O_WRONLY | O_CLOEXEC);
  }
  if (fd < 0) throw std::runtime_error(std::string("cannot open the log target: ") + std::strerror(errno));
  return fd;
}

struct ResultDeleter {
  void operator()(char* p) const { releaseResult(p); }
};

}  // namespace

StdoutRedirect::StdoutRedirect(const OutputOptions& options) {
  const int target = openLogTarget(options);
  flushAll();
  saved_ = ::fcntl(1, F_DUPFD_CLOEXEC, 0);
  if (saved_ < 0 || ::dup2(target, 1) < 0) {
    const int err = errno;
    ::close(target);
    if (saved_ >= 0) ::close(saved_);
    saved_ = -1;
    throw std::runtime_error(std::string("cannot redirect standard output: ") + std::strerror(err));
  }
  ::close(target);
}

StdoutRedirect::~StdoutRedirect() { restore(); }

void StdoutRedirect::restore() {
  if (saved_ < 0) return;
  flushAll();
  ::dup2(saved_, 1);
  ::close(saved_);
  saved_ = -1;
}

void reportError(const std::string& message) {
  std::cerr << "viraduve: " << message << std::endl;
}

int runTextCall(const OutputOptions& options, const std::function<char*()>& call) {
  // The answer file is opened first, so an impossible -o refuses before the capture is touched.
  std::ofstream outFile;
  if (!options.outFile.empty()) {
    outFile.open(options.outFile, std::ios::binary | std::ios::trunc);
    if (!outFile) throw UsageError("cannot write output file " + options.outFile);
  }
  std::unique_ptr<char, ResultDeleter> answer;
  {
    StdoutRedirect redirect(options);
    answer.reset(call());
  }
  if (!answer) {
    reportError("request refused: a JSON document did not parse or the mode is not recognised");
    return kExitRefused;
  }
  if (std::strcmp(answer.get(), "error") == 0) {
    reportError("analysis failed: the library answered \"error\" (see the log: --log FILE or -v)");
    return kExitError;
  }
  std::string text = answer.get();
  answer.reset();
  if (options.summary) text = summariseAnswer(text);
  std::ostream& out = options.outFile.empty() ? std::cout : outFile;
  out << text;
  if (!text.empty() && text.back() != '\n') out << '\n';
  out.flush();
  if (!out) {
    reportError("cannot write the answer");
    return kExitError;
  }
  return kExitAnswer;
}

}  // namespace cli
}  // namespace viraduve
