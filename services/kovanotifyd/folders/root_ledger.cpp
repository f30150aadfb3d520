#include "services/kovanotifyd/folders/root_ledger.h"

#include <fcntl.h>

#include <algorithm>
#include <utility>

#include "base/unique_fd.h"

namespace ferrox::notifyd {

namespace {

bool Contains(const std::vector<std::string>& names, std::string_view name) {
  return std::find(names.begin(), names.end(), name) != names.end();
}

}  // namespace

bool NameFilter::Wants(std::string_view name) const {
  return std::any_of(ignored_.begin(), ignored_.end(), [name](const auto* names) { return !Contains(*names, name); });
}

bool NameFilter::operator==(const NameFilter& other) const {
  return std::equal(ignored_.begin(), ignored_.end(), other.ignored_.begin(), other.ignored_.end(),
                    [](const auto* a, const auto* b) { return *a == *b; });
}

void RootPassages::Mark(const std::vector<FolderTree::Ref>& roots) {
  for (const FolderTree::Ref ref : std::exchange(marked_, {})) {
    const FolderTree::Id id = tree_.Get(ref);
    if (id != kNoFolder) tree_.Set(id, FolderTree::kPassage, false);
  }
  for (const FolderTree::Ref root : roots) {
    FolderTree::Id at = tree_.Get(root);
    while (at != kNoFolder && at != FolderTree::kTop) {
      at = tree_.Parent(at);
      if (tree_.Has(at, FolderTree::kPassage)) break;
      tree_.Set(at, FolderTree::kPassage, true);
      marked_.push_back(tree_.RefOf(at));
    }
  }
}

void RootPassages::Watch(FolderTree::Id root) {
  for (FolderTree::Id at = root; at != FolderTree::kTop;) {
    at = tree_.Parent(at);
    if (tree_.IsCovered(at)) return;
    const base::UniqueFd folder(open(tree_.Path(at).c_str(), O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC));
    FolderKey key = 0;
    if (!folder.Valid() || watches_.Watch(folder.Get(), FolderPort::Wanted::kPlace, key) != 0) continue;
    if (tree_.ByKey(key) != kNoFolder) continue;
    watches_.Drop(at);
    tree_.SetKey(at, key);
  }
}

void RootLedger::Add(const WatchRoot& root) {
  const Id id = tree_.FindOrAdd(root.path);
  tree_.Set(id, FolderTree::kRoot, true);
  roots_[root.path] = {root.ignore, tree_.RefOf(id)};
  MarkPassages();
  queue_.Walks().Start(root.path, tree_.RefOf(id));
}

/// Where another root lies above, the folders stay watched; those that only the removed root did not ignore, or that it
/// alone had set up, are found by listing them again.
void RootLedger::Remove(const std::string& root) {
  const auto found = roots_.find(root);
  if (found == roots_.end()) return;
  const Id id = tree_.Get(found->second.folder);
  const std::vector<std::string> ignore = std::move(found->second.ignore);
  roots_.erase(found);
  queue_.Walks().Cancel(root);
  if (id == kNoFolder) return;
  tree_.Set(id, FolderTree::kRoot, false);
  MarkPassages();
  if (!tree_.IsCovered(id)) return Prune(id);
  for (const std::string& over : PathsOver(id)) {
    if (roots_.at(over).ignore != ignore || tree_.Key(id) == 0) return queue_.AddFolder(tree_.RefOf(id), true);
  }
}

void RootLedger::Refuse(const std::string& root, const std::string& reason, WatchListener& listener) {
  if (roots_.count(root) == 0) return;
  Remove(root);
  listener.OnRefused(root, reason);
}

void RootLedger::WalkAll() {
  for (const auto& [path, root] : roots_) queue_.Walks().Start(path, root.folder);
}

std::vector<std::string> RootLedger::Paths() const {
  std::vector<std::string> paths;
  for (const auto& [path, root] : roots_) paths.push_back(path);
  return paths;
}

std::vector<std::string> RootLedger::PathsOver(Id id) const {
  std::vector<std::string> paths;
  for (Id at = id;; at = tree_.Parent(at)) {
    if (tree_.Has(at, FolderTree::kRoot)) paths.push_back(tree_.Path(at));
    if (at == FolderTree::kTop) return paths;
  }
}

std::vector<std::string> RootLedger::PathsWithin(Id id) const {
  std::vector<std::string> paths;
  if (!tree_.LeadsToRoot(id)) return paths;
  for (const auto& [path, root] : roots_) {
    const Id folder = tree_.Get(root.folder);
    if (folder != kNoFolder && tree_.IsWithin(folder, id)) paths.push_back(path);
  }
  return paths;
}

/// Counted only where the tree has changed since the last call: the status asks for all roots.
uint64_t RootLedger::Watches(const std::string& root) const {
  const auto found = roots_.find(root);
  if (found == roots_.end()) return 0;
  Count& count = found->second.count;
  if (count.at != tree_.Changes()) count = {tree_.Changes(), tree_.CountKeys(tree_.Get(found->second.folder))};
  return count.watches;
}

/// A root counts if the way from it to the folder has none of the names that it ignores.
NameFilter RootLedger::FilterIn(Id id) const {
  NameFilter filter;
  std::vector<std::string_view> names;
  for (Id at = id;; at = tree_.Parent(at)) {
    if (tree_.Has(at, FolderTree::kRoot)) {
      const std::vector<std::string>& ignore = roots_.at(tree_.Path(at)).ignore;
      const bool is_ignored =
          std::any_of(names.begin(), names.end(), [&ignore](std::string_view name) { return Contains(ignore, name); });
      if (!is_ignored) filter.AddRoot(ignore);
    }
    if (at == FolderTree::kTop) return filter;
    names.push_back(tree_.Name(at));
  }
}

bool RootLedger::IsOnMountOfRoot(Id id, uint64_t mount) {
  Id innermost = id;
  while (!tree_.Has(innermost, FolderTree::kRoot)) innermost = tree_.Parent(innermost);
  Root& root = roots_.at(tree_.Path(innermost));
  if (innermost == id) root.mount = mount;
  return root.mount == mount || root.mount == 0;
}

void RootLedger::RemoveFolder(Id id, WatchListener& listener) {
  const std::vector<std::string> roots = Detach(id);
  watches_.RemoveFromTree(id);
  Reattach(roots, listener);
}

void RootLedger::MoveFolder(Id id, Id parent, std::string_view name, WatchListener& listener) {
  const std::vector<std::string> roots = Detach(id);
  tree_.Move(id, parent, name);
  Reattach(roots, listener);
}

/// Takes the roots at and below a folder out of the tree; Reattach puts them back at their paths.
std::vector<std::string> RootLedger::Detach(Id id) {
  std::vector<std::string> roots = PathsWithin(id);
  for (const std::string& path : roots) tree_.Set(tree_.Get(roots_.at(path).folder), FolderTree::kRoot, false);
  return roots;
}

void RootLedger::Reattach(const std::vector<std::string>& roots, WatchListener& listener) {
  if (roots.empty()) return;
  for (const std::string& path : roots) {
    const Id id = tree_.FindOrAdd(path);
    tree_.Set(id, FolderTree::kRoot, true);
    roots_.at(path).folder = tree_.RefOf(id);
  }
  MarkPassages();
  for (const std::string& path : roots) listener.OnRootDisturbed(path);
}

void RootLedger::Disturb(Id id, WatchListener& listener) const {
  for (const std::string& path : PathsWithin(id)) listener.OnRootDisturbed(path);
}

void RootLedger::MarkPassages() {
  std::vector<Ref> folders;
  for (const auto& [path, root] : roots_) folders.push_back(root.folder);
  passages_.Mark(folders);
}

/// Removes from the tree what is at and below a folder, but no root with what is below that, and then the folders above
/// that led there alone.
void RootLedger::Prune(Id id) {
  if (tree_.Has(id, FolderTree::kRoot)) return;
  if (!tree_.Has(id, FolderTree::kPassage)) {
    while (id != FolderTree::kTop) {
      const Id parent = tree_.Parent(id);
      watches_.RemoveFromTree(id);
      const bool needed = tree_.IsCovered(parent) || tree_.Has(parent, FolderTree::kPassage);
      if (needed || tree_.FirstChild(parent) != kNoFolder) return;
      id = parent;
    }
    return watches_.Drop(id);
  }
  watches_.Drop(id);
  for (Id child = tree_.FirstChild(id), next = kNoFolder; child != kNoFolder; child = next) {
    next = tree_.NextSibling(child);
    Prune(child);
  }
  for (const std::string& path : PathsWithin(id)) WatchPassages(tree_.Get(roots_.at(path).folder));
}

}  // namespace ferrox::notifyd
