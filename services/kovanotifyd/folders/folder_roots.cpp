#include <fcntl.h>

#include <algorithm>

#include "services/kovanotifyd/folders/folder_watcher.h"

// The roots: which folders are in the tree for their sake, and what becomes of these with them.

namespace ferrox::notifyd {

void FolderWatcher::Add(const WatchRoot& root) {
  const Id id = tree_.FindOrAdd(root.path);
  tree_.Set(id, FolderTree::kRoot, true);
  roots_[root.path] = {root.ignore, tree_.RefOf(id)};
  MarkPassages();
  StartWalk(root.path);
}

void FolderWatcher::Remove(const std::string& root) {
  const auto found = roots_.find(root);
  if (found == roots_.end()) return;
  const Id id = tree_.Get(found->second.folder);
  const std::vector<std::string> ignore = std::move(found->second.ignore);
  roots_.erase(found);
  std::erase_if(walks_, [&root](const Walk& walk) { return walk.root == root; });
  if (id == kNone) return;
  tree_.Set(id, FolderTree::kRoot, false);
  MarkPassages();
  if (!IsCovered(id)) return Prune(id);
  for (const std::string& over : RootsOver(id)) {
    if (roots_.at(over).ignore != ignore || tree_.Key(id) == 0) return checks_.push_back({tree_.RefOf(id), true});
  }
}

/// Counted again where a folder was added, moved or removed since.
uint64_t FolderWatcher::Watches(const std::string& root) const {
  const auto found = roots_.find(root);
  if (found == roots_.end()) return 0;
  Count& count = found->second.count;
  if (count.at != tree_.Changes()) count = {tree_.Changes(), CountWatches(tree_.Get(found->second.folder))};
  return count.watches;
}

uint64_t FolderWatcher::CountWatches(Id top) const {
  uint64_t watches = 0;
  for (Id at = top; at != kNone;) {
    if (tree_.Key(at) != 0) ++watches;
    if (tree_.FirstChild(at) != kNone) {
      at = tree_.FirstChild(at);
      continue;
    }
    while (at != top && tree_.NextSibling(at) == kNone) at = tree_.Parent(at);
    at = at == top ? kNone : tree_.NextSibling(at);
  }
  return watches;
}

/// The innermost first.
std::vector<std::string> FolderWatcher::RootsOver(Id id) const {
  std::vector<std::string> roots;
  for (Id at = id;; at = tree_.Parent(at)) {
    if (tree_.Has(at, FolderTree::kRoot)) roots.push_back(tree_.Path(at));
    if (at == FolderTree::kTop) return roots;
  }
}

std::vector<std::string> FolderWatcher::RootsWithin(Id id) const {
  std::vector<std::string> roots;
  if (!LeadsToRoot(id)) return roots;
  for (const auto& [path, root] : roots_) {
    const Id folder = tree_.Get(root.folder);
    if (folder != kNone && tree_.IsWithin(folder, id)) roots.push_back(path);
  }
  return roots;
}

std::vector<FolderTree::Ref> FolderWatcher::Children(Id id) const {
  std::vector<Ref> children;
  for (Id at = tree_.FirstChild(id); at != kNone; at = tree_.NextSibling(at)) children.push_back(tree_.RefOf(at));
  return children;
}

bool FolderWatcher::IsCovered(Id id) const {
  while (id != FolderTree::kTop && !tree_.Has(id, FolderTree::kRoot)) id = tree_.Parent(id);
  return tree_.Has(id, FolderTree::kRoot);
}

/// What each root that wants the folder `id` watched ignores.
std::vector<const std::vector<std::string>*> FolderWatcher::IgnoredIn(Id id) const {
  std::vector<const std::vector<std::string>*> ignored;
  std::vector<std::string_view> names;
  for (Id at = id;; at = tree_.Parent(at)) {
    if (tree_.Has(at, FolderTree::kRoot)) {
      const std::vector<std::string>& ignore = roots_.at(tree_.Path(at)).ignore;
      const bool none = std::none_of(names.begin(), names.end(), [&ignore](std::string_view name) {
        return std::find(ignore.begin(), ignore.end(), name) != ignore.end();
      });
      if (none) ignored.push_back(&ignore);
    }
    if (at == FolderTree::kTop) return ignored;
    names.push_back(tree_.Name(at));
  }
}

/// Whether the same is watched below both.
bool FolderWatcher::HaveSameRules(Id a, Id b) const {
  const auto ignored_a = IgnoredIn(a);
  const auto ignored_b = IgnoredIn(b);
  return std::equal(ignored_a.begin(), ignored_a.end(), ignored_b.begin(), ignored_b.end(),
                    [](const auto* x, const auto* y) { return *x == *y; });
}

bool FolderWatcher::IsWanted(Id parent, std::string_view name) const {
  const auto ignored = IgnoredIn(parent);
  return std::any_of(ignored.begin(), ignored.end(), [name](const auto* names) {
    return std::find(names->begin(), names->end(), name) == names->end();
  });
}

void FolderWatcher::RemoveFolder(Id id, WatchListener& listener) {
  const std::vector<std::string> roots = DetachRoots(id);
  tree_.Remove(id, [this](Id each) { DropKey(each); });
  ReattachRoots(roots, listener);
}

/// Roots belong to paths: those at and below a folder that goes elsewhere stay where they are.
std::vector<std::string> FolderWatcher::DetachRoots(Id id) {
  std::vector<std::string> roots = RootsWithin(id);
  for (const std::string& path : roots) tree_.Set(tree_.Get(roots_.at(path).folder), FolderTree::kRoot, false);
  return roots;
}

void FolderWatcher::ReattachRoots(const std::vector<std::string>& roots, WatchListener& listener) {
  if (roots.empty()) return;
  for (const std::string& path : roots) {
    const Id id = tree_.FindOrAdd(path);
    tree_.Set(id, FolderTree::kRoot, true);
    roots_.at(path).folder = tree_.RefOf(id);
  }
  MarkPassages();
  for (const std::string& path : roots) listener.OnRootDisturbed(path);
}

void FolderWatcher::Disturb(Id id, WatchListener& listener) {
  for (const std::string& path : RootsWithin(id)) listener.OnRootDisturbed(path);
}

void FolderWatcher::Refuse(const std::string& root, const std::string& reason, WatchListener& listener) {
  if (roots_.count(root) == 0) return;
  Remove(root);
  listener.OnRefused(root, reason);
}

void FolderWatcher::MarkPassages() {
  for (const Ref ref : passages_) {
    const Id id = tree_.Get(ref);
    if (id != kNone) tree_.Set(id, FolderTree::kPassage, false);
  }
  passages_.clear();
  for (const auto& [path, root] : roots_) {
    Id at = tree_.Get(root.folder);
    while (at != kNone && at != FolderTree::kTop) {
      at = tree_.Parent(at);
      if (tree_.Has(at, FolderTree::kPassage)) break;
      tree_.Set(at, FolderTree::kPassage, true);
      passages_.push_back(tree_.RefOf(at));
    }
  }
}

/// So that the root is known to be elsewhere when one of the folders above it is moved. What cannot be watched there is
/// left out.
void FolderWatcher::WatchPassages(Id root) {
  for (Id at = root; at != FolderTree::kTop;) {
    at = tree_.Parent(at);
    if (IsCovered(at)) return;
    const base::UniqueFd folder(open(tree_.Path(at).c_str(), O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC));
    FolderKey key = 0;
    if (!folder.Valid() || port_->Watch(folder.Get(), FolderPort::Wanted::kPlace, key) != 0) continue;
    if (tree_.ByKey(key) != kNone) continue;
    DropKey(at);
    tree_.SetKey(at, key);
  }
}

/// Removes what is in the tree at and below a folder for no root, and the folders that led there.
void FolderWatcher::Prune(Id id) {
  if (tree_.Has(id, FolderTree::kRoot)) return;
  if (!tree_.Has(id, FolderTree::kPassage)) {
    while (id != FolderTree::kTop) {
      const Id parent = tree_.Parent(id);
      tree_.Remove(id, [this](Id each) { DropKey(each); });
      const bool needed = IsCovered(parent) || tree_.Has(parent, FolderTree::kPassage);
      if (needed || tree_.FirstChild(parent) != kNone) return;
      id = parent;
    }
    return DropKey(id);
  }
  DropKey(id);
  for (Id child = tree_.FirstChild(id), next = kNone; child != kNone; child = next) {
    next = tree_.NextSibling(child);
    Prune(child);
  }
  for (const std::string& path : RootsWithin(id)) WatchPassages(tree_.Get(roots_.at(path).folder));
}

void FolderWatcher::DropKey(Id id) {
  const FolderKey key = tree_.Key(id);
  if (key == 0) return;
  dead_.emplace_back(key, port_->UnwatchesByPath() ? tree_.Path(id) : std::string());
  tree_.SetKey(id, 0);
}

void FolderWatcher::StartWalk(const std::string& root) {
  std::erase_if(walks_, [&root](const Walk& walk) { return walk.root == root; });
  walks_.push_back({root, {roots_.at(root).folder}});
}

}  // namespace ferrox::notifyd
