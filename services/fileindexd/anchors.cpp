#include "services/fileindexd/anchors.h"

#include <algorithm>
#include <cstddef>
#include <set>
#include <string_view>

#include "base/path.h"

namespace ferrox::indexd {

namespace {

constexpr size_t kAtOnce = 1000;

}  // namespace

Anchors::Anchors(const std::string& root, const ShareFolders& folders, DocumentWriter& writer) : writer_(writer) {
  std::set<std::string> paths = {root};
  for (const std::string& folder : folders.Topmost(root)) {
    for (std::string_view above = base::ParentOf(folder); base::IsBelow(above, root); above = base::ParentOf(above)) {
      paths.insert(std::string(above));
    }
  }
  paths_ = {paths.begin(), paths.end()};
}

void Anchors::Record() {
  for (size_t at = 0; at < paths_.size(); at += kAtOnce) {
    const auto begin = paths_.begin() + static_cast<std::ptrdiff_t>(at);
    const auto end = begin + static_cast<std::ptrdiff_t>(std::min(kAtOnce, paths_.size() - at));
    (void)writer_.RecordAccess({begin, end});
  }
}

}  // namespace ferrox::indexd
