// The frame every exported analysis call shares: argument texts, JSON parsing with the
// failure lines, straightening of the channel files, and the three kinds of answer.
#pragma once

#include <functional>
#include <string>
#include <vector>

#include <json/json.h>
#include <opencv2/core/mat.hpp>

#include "viraduve/records.h"

namespace viraduve {
namespace api {

// The constant answer of a failed analysis.
extern const char kErrorAnswer[];

// A null argument reads as the empty text.
std::string textArg(const char* text);

// Parses text into root with a reader of this call (comments collected). On failure logs
// failureLine, then the reader's formatted messages, and returns false.
bool parseJson(const std::string& text, Json::Value& root, const char* failureLine);

// A malloc'ed, zero-terminated copy of text (the success answer).
char* answerText(const std::string& text);

// Runs body; any exception is logged (its what() for std exceptions), followed by
// "ERROR in __FUNCTION__ = <functionName>", and the answer is kErrorAnswer.
char* guardTextCall(const char* functionName, const std::function<char*()>& body);
// The same for integer-status calls: an exception answers failureStatus.
int guardStatusCall(const char* functionName, int failureStatus, const std::function<int()>& body);

// Replaces the image file at path by picture (format from the extension of path): the picture
// is written to a temporary file in the same folder and renamed over path. When anything
// fails the temporary file is removed, path keeps its old content and the error is thrown.
void writeImageAtomically(const std::string& path, const cv::Mat& picture);

// Bakes each channel's flips and rotation into its file (written atomically through a
// temporary file and a rename) and clears them in params.
void applyChannelGeometry(const std::string& imageDir, std::vector<ImageParam>& params);

}  // namespace api
}  // namespace viraduve
