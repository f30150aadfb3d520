#include "services/fileindexd/stray_documents.h"

#include <vector>

#include "common/file_util.h"

namespace ferrox::indexd {

namespace {

std::string FirstOutside(const std::vector<IndexedEntry>& found, const std::string& root) {
  return found.empty() || StringStartWith(found.front().path, root + "/") ? "" : found.front().path;
}

}  // namespace

std::string FindStray(ShareIndex& index, const std::string& root) {
  std::string stray = FirstOutside(index.List("", "", 1), root);
  if (!stray.empty()) return stray;
  // "0" follows "/": all below the root comes before this.
  const std::string behind = root + "0";
  stray = FirstOutside(index.Find(behind), root);
  return !stray.empty() ? stray : FirstOutside(index.List("", behind, 1), root);
}

std::string FolderOfStrays(const std::string& stray, const std::string& root) {
  size_t end = 0;
  do {
    end = stray.find('/', end + 1);
    const std::string top = stray.substr(0, end);
    if (!StringStartWith(root + "/", top + "/")) return top;
  } while (end != std::string::npos);
  return "";
}

}  // namespace ferrox::indexd
