// The error every blobkit image function raises: a standard exception carrying its text.
#pragma once

#include <exception>
#include <string>

namespace blobkit {

class imageException : public std::exception {
 public:
  explicit imageException(std::string message) : message_(std::move(message)) {}
  const char* what() const noexcept override { return message_.c_str(); }

 private:
  std::string message_;
};

}  // namespace blobkit
