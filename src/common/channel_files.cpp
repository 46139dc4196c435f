#include "common/channel_files.h"

#include <algorithm>
#include <filesystem>
#include <system_error>

namespace viraduve {

std::vector<std::string> listChannelFiles(const std::string& dir) {
  namespace fs = std::filesystem;
  std::vector<std::string> names;
  std::error_code ec;
  fs::directory_iterator it(dir, ec);
  if (ec) return names;
  for (const fs::directory_entry& entry : it) {
    const fs::path& p = entry.path();
    const std::string name = p.filename().string();
    if (name.rfind("ch", 0) == 0 && p.extension().string() == ".tif") names.push_back(name);
  }
  std::sort(names.begin(), names.end());
  return names;
}

std::string joinPath(const std::string& dir, const std::string& name) { return dir + "/" + name; }

}  // namespace viraduve
