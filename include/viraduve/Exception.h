// The library's error: a negative code, a message and where it was raised.
#pragma once

#include <exception>
#include <string>

#include "viraduve/export.h"

namespace viraduve {

class VIRADUVE_EXPORT Exception : public std::exception {
 public:
  Exception(int code, const std::string& message, const std::string& function,
            const std::string& file, int line);
  ~Exception() override;
  const char* what() const noexcept override;

  int code;
  std::string message;
  std::string function;
  std::string file;
  int line;

 private:
  std::string text_;
};

}  // namespace viraduve
