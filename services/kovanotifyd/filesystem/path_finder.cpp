#include "services/kovanotifyd/filesystem/path_finder.h"

#include <utility>

namespace ferrox::notifyd {

bool PathFinder::Find(const HandleKey& folder, std::string_view name, std::vector<std::string>& paths,
                      WatchListener& listener) {
  const FolderCache::Folder* found = locator_.Locate(folder);
  if (found != nullptr) return roots_.FullPaths(*found, name, paths);
  paths.clear();
  ReportUncertain(folder, listener);
  return false;
}

void PathFinder::ReportUncertain(const HandleKey& key, WatchListener& listener) {
  if (std::exchange(has_reported_, true)) return;
  for (const std::string& root : roots_.PathsOn(key)) listener.OnChange({Change::Kind::kUncertain, true, root});
}

}  // namespace ferrox::notifyd
