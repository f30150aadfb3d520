#include "services/kovanotifyd/roots/watch_roots.h"

#include <algorithm>
#include <map>
#include <set>

#include "base/path.h"

namespace ferrox::notifyd {

namespace {

using Names = std::set<std::string>;

/// The names to ignore in each registered folder: of one that is registered several times, those that all ignore.
std::map<std::string, Names> IgnoredByPath(const std::vector<Registration>& registrations) {
  std::map<std::string, Names> ignored;
  for (const Registration& registration : registrations) {
    for (const QueueWatch& watch : registration.watches) {
      const Names names(watch.ignore.begin(), watch.ignore.end());
      const auto [known, is_new] = ignored.try_emplace(watch.path, names);
      if (!is_new) std::erase_if(known->second, [&](const std::string& name) { return names.count(name) == 0; });
    }
  }
  return ignored;
}

/// Whether a component of the path, from that offset on, is one of the names.
bool HasComponentOf(const std::string& path, size_t from, const Names& names) {
  for (size_t begin = from; begin < path.size();) {
    const size_t end = std::min(path.find('/', begin), path.size());
    if (names.count(path.substr(begin, end - begin)) != 0) return true;
    begin = end + 1;
  }
  return false;
}

}  // namespace

bool Covers(const WatchRoot& outer, const WatchRoot& inner) {
  if (!base::IsAtOrBelow(inner.path, outer.path)) return false;
  const Names ignored(outer.ignore.begin(), outer.ignore.end());
  const Names ignored_inside(inner.ignore.begin(), inner.ignore.end());
  return std::includes(ignored_inside.begin(), ignored_inside.end(), ignored.begin(), ignored.end()) &&
         !HasComponentOf(inner.path, outer.path.size() + 1, ignored);
}

std::vector<WatchRoot> WatchRoots(
    const std::vector<Registration>& registrations,
    const std::function<bool(const std::string& outer, const std::string& inner)>& same_mount) {
  std::vector<WatchRoot> roots;
  for (const auto& [path, names] : IgnoredByPath(registrations)) {
    const WatchRoot root = {path, {names.begin(), names.end()}};
    const bool covered = std::any_of(roots.begin(), roots.end(), [&root = root, &same_mount](const WatchRoot& outer) {
      return Covers(outer, root) && same_mount(outer.path, root.path);
    });
    if (!covered) roots.push_back(root);
  }
  return roots;
}

}  // namespace ferrox::notifyd
