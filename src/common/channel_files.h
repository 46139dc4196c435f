// The channel files of a capture folder.
#pragma once

#include <string>
#include <vector>

namespace viraduve {

// Names (not paths) of the entries of dir that begin with "ch" and end in ".tif", in
// byte-wise name order (ch0, ch1, ch10, ch2, ...). This fixed order stands for the folder
// listing order the channel parameters are paired with; never rely on readdir order.
// A folder that cannot be listed gives an empty list.
std::vector<std::string> listChannelFiles(const std::string& dir);

// dir + "/" + name.
std::string joinPath(const std::string& dir, const std::string& name);

}  // namespace viraduve
