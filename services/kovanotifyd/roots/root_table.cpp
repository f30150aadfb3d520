#include "services/kovanotifyd/roots/root_table.h"

#include <algorithm>
#include <utility>

#include "services/kovanotifyd/roots/watch_roots.h"

namespace ferrox::notifyd {

RootTable::Roots RootTable::Replace(const std::vector<WatchRoot>& watches) {
  Roots kept;
  for (const WatchRoot& watch : watches) {
    const auto known = roots_.find(watch.path);
    if (known != roots_.end() && known->second.watch.ignore == watch.ignore) {
      kept.insert(roots_.extract(known));
    } else {
      kept.emplace(watch.path, RootState{watch});
    }
  }
  return std::exchange(roots_, std::move(kept));
}

RootState* RootTable::Find(size_t way, const std::string& path) {
  const auto found = roots_.find(path);
  if (found == roots_.end()) return nullptr;
  RootState& root = found->second;
  const bool has_watcher = root.phase == RootState::Phase::kSettingUp || root.phase == RootState::Phase::kCovered;
  return has_watcher && root.way == way ? &root : nullptr;
}

const RootState* RootTable::CoveringRoot(const QueueWatch& watch) const {
  const RootState* nearest = nullptr;
  for (const auto& [path, root] : roots_) {
    if (Covers(root.watch, {watch.path, watch.ignore})) nearest = &root;
  }
  return nearest;
}

bool RootTable::Has(RootState::Phase phase) const {
  return std::any_of(roots_.begin(), roots_.end(), [phase](const auto& entry) { return entry.second.phase == phase; });
}

bool RootTable::HasMissing() const {
  return std::any_of(roots_.begin(), roots_.end(), [](const auto& entry) { return entry.second.IsMissing(); });
}

bool RootTable::IsCovering(size_t way) const {
  return std::any_of(roots_.begin(), roots_.end(), [way](const auto& entry) {
    return entry.second.phase == RootState::Phase::kCovered && entry.second.way == way;
  });
}

std::vector<std::string> RootTable::Problems() const {
  std::vector<std::string> problems;
  for (const auto& [path, root] : roots_) {
    if (root.IsWatched()) continue;
    problems.push_back("changes of " + path + " are not noticed: " + (root.IsMissing() ? "it " : "") + root.reason);
  }
  return problems;
}

}  // namespace ferrox::notifyd
