// Request documents of the command line: read from files or given inline, checked before the
// library sees them, and the default image parameters of a capture folder.
#pragma once

#include <stdexcept>
#include <string>
#include <vector>

namespace viraduve {
namespace cli {

// A problem with what the user gave (missing folder, unreadable file, invalid JSON): reported
// as one line before the library is called, so nothing in the capture is touched.
class UsageError : public std::runtime_error {
 public:
  using std::runtime_error::runtime_error;
};

// The text of a document option: inline JSON when the value starts with '{' or '[' (after
// blanks), the standard input for "-", otherwise the path of a file. The text must parse as
// JSON with the library's reader, or UsageError names the option and the first parser error.
std::string loadDocument(const std::string& option, const std::string& value);

// Throws UsageError unless dir is an existing folder.
void requireFolder(const std::string& dir);
// Throws UsageError unless path is a readable regular file.
void requireReadableFile(const std::string& path);

// Channel files of a capture folder (names "ch...tif"), in byte-wise name order.
std::vector<std::string> channelFiles(const std::string& dir);
// Throws UsageError when the folder holds no channel file.
void requireChannelFiles(const std::string& dir);

// {"ImageParas": [...]} with one neutral element per channel file: full display range,
// gamma 1, no flips or rotation, the mode as the channel role, and the background
// white for the modes whose captures are dark on bright.
std::string defaultImageParas(const std::string& dir, const std::string& mode);

}  // namespace cli
}  // namespace viraduve
