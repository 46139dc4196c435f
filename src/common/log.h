// Diagnostics: every message is one whole line on standard output, flushed at once.
#pragma once

#include <ctime>
#include <iostream>
#include <sstream>
#include <string>

namespace viraduve {

// Writes the parts, streamed one after the other, as one line.
template <typename... Parts>
void logLine(const Parts&... parts) {
  std::ostringstream os;
  (os << ... << parts);
  os << '\n';
  const std::string text = os.str();
  std::cout.write(text.data(), static_cast<std::streamsize>(text.size()));
  std::cout.flush();
}

// "label" + value as one line, the described "label = value" traces pass the " = " in label.
template <typename T>
void logValue(const char* label, const T& value) {
  logLine(label, value);
}

// Processor time since start in seconds, for the "Time taken" lines.
inline double secondsSince(std::clock_t start) {
  return static_cast<double>(std::clock() - start) / CLOCKS_PER_SEC;
}

}  // namespace viraduve
