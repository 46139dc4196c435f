// viraduve::Exception: formats its banner once, bounded to 65536 bytes.
#include "viraduve/Exception.h"

#include <cstdio>
#include <vector>

namespace viraduve {

Exception::Exception(int code_, const std::string& message_, const std::string& function_,
                     const std::string& file_, int line_)
    : code(code_), message(message_), function(function_), file(file_), line(line_) {
  std::vector<char> buffer(65536);
  std::snprintf(buffer.data(), buffer.size(),
                "dadodazeda Error: %s (code: %d) in the function %s of file %s at line %d",
                message.c_str(), code, function.c_str(), file.c_str(), line);
  text_ = buffer.data();
}

Exception::~Exception() = default;

const char* Exception::what() const noexcept { return text_.c_str(); }

}  // namespace viraduve
