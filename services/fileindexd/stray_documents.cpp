#include "services/fileindexd/stray_documents.h"

#include <algorithm>

#include "base/path.h"

namespace ferrox::indexd {

std::string FindStray(ShareIndex& index, const std::vector<std::string>& folders) {
  const auto holder = [&folders](const std::string& path) {
    const auto holds = [&path](const std::string& folder) { return base::IsAtOrBelow(path, folder); };
    return std::find_if(folders.begin(), folders.end(), holds);
  };
  std::string after;
  while (true) {
    const auto next = index.List("", after, 1);
    if (next.empty()) return "";
    const std::string& path = next.front().path;
    const auto folder = holder(path);
    if (folder == folders.end()) return path;
    // What is below a folder comes in one piece, and all of it before the path that ends in "0", which follows "/".
    after = path == *folder ? path : *folder + "0";
    if (path != *folder && holder(after) == folders.end() && !index.Find(after).empty()) return after;
  }
}

std::string TopOutside(const std::string& path, const std::string& root) {
  size_t end = path.find('/', 1);
  while (end != std::string::npos && base::IsAtOrBelow(root, std::string_view(path).substr(0, end))) {
    end = path.find('/', end + 1);
  }
  return path.substr(0, end);
}

}  // namespace ferrox::indexd
