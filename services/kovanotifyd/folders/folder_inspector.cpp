#include "services/kovanotifyd/folders/folder_inspector.h"

#include <sys/stat.h>

#include <cerrno>
#include <cstring>
#include <optional>
#include <string_view>
#include <utility>

#include "services/kovanotifyd/folders/folder_on_disk.h"

namespace ferrox::notifyd {

void FolderInspector::InspectNext(WatchListener& listener) {
  const std::optional<InspectionQueue::Folder> next = queue_.TakeFolder();
  if (!next.has_value()) return InspectName(queue_.TakeName(), listener);
  const Id id = tree_.Get(next->folder);
  if (id != kNoFolder && tree_.IsCovered(id)) InspectAndReport(id, next->relist, listener);
}

void FolderInspector::ContinueWalk(WatchListener& listener) {
  const std::string root = queue_.Walks().Root();
  if (const std::optional<Ref> next = queue_.Walks().TakeFolder(); next.has_value()) {
    const Id id = tree_.Get(*next);
    std::vector<Ref> below;
    if (id != kNoFolder && tree_.IsCovered(id)) (void)Inspect(id, true, below, listener);
    return queue_.Walks().AddFolders(root, below);  // the root may have been refused meanwhile
  }
  queue_.Walks().End();
  const Id id = roots_.FolderOf(root);
  if (id == kNoFolder || tree_.Key(id) == 0) return roots_.Refuse(root, "it was moved or removed", listener);
  listener.OnCovered(root);
}

void FolderInspector::InspectAndReport(Id id, bool relist, WatchListener& listener) {
  const std::string path = tree_.Path(id);
  const bool was_unreadable = tree_.Has(id, FolderTree::kUnreadable);
  std::vector<Ref> below;
  const Finding finding = Inspect(id, relist, below, listener);
  for (const Ref ref : below) queue_.AddFolder(ref, relist);
  if (finding == Finding::kNew || (finding == Finding::kUnreadable && !was_unreadable)) {
    listener.OnChange({Change::Kind::kCreated, true, path});
  } else if (finding == Finding::kOther || finding == Finding::kGone) {
    listener.OnChange({Change::Kind::kUncertain, true, path});
  }
}

/// Watches the folder at the path of `id`. If it is another one than before, or with `relist`, it is listed, and the
/// folders in it are added to `below`. `id` may be gone afterwards.
FolderInspector::Finding FolderInspector::Inspect(Id id, bool relist, std::vector<Ref>& below,
                                                  WatchListener& listener) {
  base::UniqueFd folder(OpenFolder(tree_.Path(id)));
  if (!folder.Valid()) return OnFailure(id, errno, listener);
  if (!roots_.IsOnMountOfRoot(id, MountOf(folder.Get()))) {
    roots_.RemoveFolder(id, listener);
    return Finding::kGone;
  }
  const Finding finding = Watch(id, folder.Get(), listener);
  if (finding != Finding::kSame && finding != Finding::kNew && finding != Finding::kOther) return finding;
  queue_.NoteInspected(id);
  if (tree_.Has(id, FolderTree::kRoot)) roots_.WatchPassages(id);
  if (relist || finding != Finding::kSame) List(id, std::move(folder), below, listener);
  return finding;
}

FolderInspector::Finding FolderInspector::Watch(Id id, int folder, WatchListener& listener) {
  const FolderKey old = tree_.Key(id);
  if (old == 0 && watches_.IsFull()) return OnFailure(id, ENOSPC, listener);
  FolderKey key = 0;
  const int error = watches_.Watch(folder, FolderPort::Wanted::kAll, key);
  if (error != 0) return OnFailure(id, error, listener);
  tree_.Set(id, FolderTree::kUnreadable, false);
  if (key == old) return Finding::kSame;
  if (!TakeOverKey(id, folder, key, listener)) return Finding::kRefused;
  watches_.Drop(id);
  tree_.SetKey(id, key);
  return old == 0 ? Finding::kNew : Finding::kOther;
}

/// Takes the key of the open folder from the place in the tree that has it: the kernel's folder is at `id` now, and the
/// other place has to be inspected. False when the folder is really in both places, by a bind mount: records could not
/// be told apart then, so the roots over `id` are refused.
bool FolderInspector::TakeOverKey(Id id, int folder, FolderKey key, WatchListener& listener) {
  const Id other = tree_.ByKey(key);
  if (other == kNoFolder) return true;
  const std::string other_path = tree_.Path(other);
  if (IsAt(other_path, folder) && IsAt(tree_.Path(id), folder)) {
    for (const std::string& root : roots_.PathsOver(id)) {
      roots_.Refuse(root, "holds the folder " + other_path + ", which is watched there already", listener);
    }
    return false;
  }
  tree_.SetKey(other, 0);
  queue_.AddFolder(tree_.RefOf(other), false);
  return true;
}

/// The folder at the path of `id` is not there, cannot be read, or cannot be watched; only the last of these makes the
/// roots over it fail, but a root needs its own folder.
FolderInspector::Finding FolderInspector::OnFailure(Id id, int error, WatchListener& listener) {
  const bool gone = error == ENOENT || error == ENOTDIR || error == ELOOP || error == ESTALE;
  const bool unreadable = error == EACCES || error == ENAMETOOLONG || error == EIO;
  if (!gone && !unreadable) {
    const std::string reason = watches_.Reason(error);
    for (const std::string& root : roots_.PathsOver(id)) roots_.Refuse(root, reason, listener);
    return Finding::kRefused;
  }
  const Ref ref = tree_.RefOf(id);
  if (tree_.Has(id, FolderTree::kRoot)) roots_.Refuse(tree_.Path(id), strerror(error), listener);
  if (tree_.Get(ref) == kNoFolder || !tree_.IsCovered(id)) return Finding::kRefused;
  if (gone) {
    RemoveGone(id, listener);
    return Finding::kGone;
  }
  MarkUnreadable(id);
  return Finding::kUnreadable;
}

void FolderInspector::RemoveGone(Id id, WatchListener& listener) {
  if (tree_.LeadsToRoot(id) && tree_.Key(id) == 0) return;  // stays for the root's sake
  // A folder above it may have been moved, and this one with it: that is known when all records have been read.
  queue_.AddNameInDoubt(tree_.Parent(id), tree_.Name(id));
  roots_.RemoveFolder(id, listener);
}

void FolderInspector::MarkUnreadable(Id id) {
  watches_.Drop(id);
  for (const Ref child : tree_.Children(id)) {
    if (!tree_.LeadsToRoot(child.id)) watches_.RemoveFromTree(child.id);
  }
  if (!tree_.Has(id, FolderTree::kUnreadable)) unreadable_.push_back(tree_.RefOf(id));
  tree_.Set(id, FolderTree::kUnreadable, true);
}

/// Makes the tree's folders below `id` those in the open folder, except for the passages to roots.
void FolderInspector::List(Id id, base::UniqueFd folder, std::vector<Ref>& below, WatchListener& listener) {
  const NameFilter filter = roots_.FilterIn(id);
  const bool is_complete = ListFolders(std::move(folder), [&](std::string_view name) {
    Id child = tree_.Child(id, name);
    const bool is_wanted = filter.Wants(name);
    if (is_wanted) {
      if (child == kNoFolder) child = tree_.Add(id, name);
      below.push_back(tree_.RefOf(child));
    }
    if (child != kNoFolder) tree_.Set(child, FolderTree::kListed, is_wanted || tree_.Has(child, FolderTree::kPassage));
  });
  for (const Ref child : tree_.Children(id)) {
    if (tree_.Get(child) == kNoFolder) continue;
    const bool stays = tree_.Has(child.id, FolderTree::kListed) || tree_.Has(child.id, FolderTree::kRoot);
    tree_.Set(child.id, FolderTree::kListed, false);
    if (is_complete && !stays) roots_.RemoveFolder(child.id, listener);
  }
}

/// A name that is no folder on disk may yet be right in the tree of a later record: it waits until all are read.
void FolderInspector::InspectName(const InspectionQueue::Name& name, WatchListener& listener) {
  const Id parent = tree_.Get(name.parent);
  if (parent == kNoFolder || !tree_.IsCovered(parent) || !roots_.FilterIn(parent).Wants(name.name)) return;
  Id child = tree_.Child(parent, name.name);
  if (child == kNoFolder) {
    struct stat status = {};
    if (lstat(tree_.Path(parent, name.name).c_str(), &status) < 0 || !S_ISDIR(status.st_mode)) {
      if (!watches_.IsAllRead()) queue_.AddNameInDoubt(parent, name.name);
      return;
    }
    child = tree_.Add(parent, name.name);
  }
  InspectAndReport(child, false, listener);
}

void FolderInspector::RetryUnreadable(Id folder) {
  if (folder == kNoFolder) return;
  std::erase_if(unreadable_, [this](Ref ref) {
    const Id id = tree_.Get(ref);
    return id == kNoFolder || !tree_.Has(id, FolderTree::kUnreadable);
  });
  for (const Ref ref : unreadable_) {
    if (folder == FolderTree::kTop || folder == ref.id || tree_.Parent(ref.id) == folder) queue_.AddFolder(ref, false);
  }
}

}  // namespace ferrox::notifyd
