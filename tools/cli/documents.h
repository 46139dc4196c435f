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
// The two halves of loadDocument: reading the option's text, and the JSON check of a text
// read from the option's value (which returns the text).
std::string readDocument(const std::string& option, const std::string& value);
std::string checkDocument(const std::string& option, const std::string& value,
                          const std::string& text);

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

// {"exportAttribute": ...} for PNG pictures at the pixel size of the folder's first channel
// file (254 dpi); channelSelection 2 exports one picture per channel, 3 one merged picture.
std::string defaultExportAttributes(const std::string& dir, bool layers, bool annotations,
                                    bool markers, unsigned channelSelection = 2);
// {"overlayList": [0, 1, ...]} naming every channel file of the folder.
std::string allChannelsOverlay(const std::string& dir);

}  // namespace cli
}  // namespace viraduve
