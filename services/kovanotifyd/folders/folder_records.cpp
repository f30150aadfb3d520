#include <sys/stat.h>

#include "services/kovanotifyd/folders/folder_watcher.h"

// What the kernel's records do to the tree of folders, and what is reported of them.

namespace ferrox::notifyd {

using Kind = FolderRecord::Kind;

void FolderWatcher::OnRecord(const FolderRecord& record, WatchListener& listener) {
  if (record.kind == Kind::kLost) return OnLost(listener);
  if (record.kind == Kind::kRenamed) return OnRenamed(record, listener);
  if (record.kind == Kind::kSelfMoved || record.kind == Kind::kSelfGone) return OnSelf(record, listener);
  if (record.kind == Kind::kAttributes && record.folder == cookie_folder_ && cookie_folder_ != 0 &&
      record.name == cookie_name_) {
    OnCookieTouched(listener);
  }
  const Id parent = tree_.ByKey(record.folder);
  if (parent != kNone && IsCovered(parent)) return OnRecordIn(parent, record, listener);
  if (record.kind == Kind::kAttributes && record.name.empty()) RetryUnreadable(FolderTree::kTop);
}

/// What is in doubt at this moment is reported first.
void FolderWatcher::OnCookieTouched(WatchListener& listener) {
  if (doubts_.empty() && checks_.empty() && places_.empty()) return listener.OnCookie();
  cookie_ = Cookie::kAfterAllRead;
}

void FolderWatcher::OnRecordIn(Id parent, const FolderRecord& record, WatchListener& listener) {
  const bool is_folder = record.is_folder;
  const std::string path = record.name.empty() ? tree_.Path(parent) : tree_.Path(parent, record.name);
  switch (record.kind) {
    case Kind::kCreated:
      if (is_folder) return OnFolderCreated(parent, record.name, listener);
      return listener.OnChange({Change::Kind::kCreated, false, path});
    case Kind::kModified:
      return OnFileChanged(Change::Kind::kModified, path, record.file, listener);
    case Kind::kWritten:
      return OnFileChanged(Change::Kind::kWritten, path, record.file, listener);
    case Kind::kAttributes:
      if (!is_folder) return OnFileChanged(Change::Kind::kAttributes, path, record.file, listener);
      RetryUnreadable(record.name.empty() ? parent : tree_.Child(parent, record.name));
      return listener.OnChange({Change::Kind::kAttributes, true, path});
    case Kind::kDeleted: {
      const Id child = is_folder ? tree_.Child(parent, record.name) : kNone;
      if (child != kNone) RemoveFolder(child, listener);
      return listener.OnChange({Change::Kind::kDeleted, is_folder, path});
    }
    case Kind::kUnsure:
      return OnUnsure(parent, record, listener);
    case Kind::kRenamed:
    case Kind::kSelfMoved:
    case Kind::kSelfGone:
    case Kind::kLost:
      break;
  }
}

/// Other names of the file may be in other queues; or the name is gone, and with it what the queue knows of the file.
void FolderWatcher::OnFileChanged(Change::Kind kind, const std::string& path, uint64_t number,
                                  WatchListener& listener) {
  listener.OnChange({kind, false, path});
  struct stat status = {};
  const bool is_there = lstat(path.c_str(), &status) == 0;
  const bool has_others = is_there && S_ISREG(status.st_mode) && status.st_nlink > 1;
  const bool is_gone = number != 0 && (!is_there || status.st_ino != number);
  if (!has_others && !is_gone) return;
  const uint64_t file = is_gone ? number : status.st_ino;
  for (const auto& [root, rules] : roots_) listener.OnChange({Change::Kind::kByNumber, false, root, {}, file});
}

/// Reported when it is watched, so that whoever compares it then misses nothing that is made in it.
void FolderWatcher::OnFolderCreated(Id parent, std::string_view name, WatchListener& listener) {
  if (!IsWanted(parent, name)) return listener.OnChange({Change::Kind::kCreated, true, tree_.Path(parent, name)});
  Id child = tree_.Child(parent, name);
  if (child != kNone && tree_.Key(child) != 0) {  // found by a listing before its record was read, or another by now
    doubts_.push_back({tree_.RefOf(parent), std::string(name)});
    return listener.OnChange({Change::Kind::kCreated, true, tree_.Path(child)});
  }
  if (child == kNone) child = tree_.Add(parent, name);
  LookAndReport(child, false, listener);
}

void FolderWatcher::OnUnsure(Id parent, const FolderRecord& record, WatchListener& listener) {
  const std::string path = tree_.Path(parent, record.name);
  if (record.is_folder) {
    doubts_.push_back({tree_.RefOf(parent), std::string(record.name)});
    return listener.OnChange({Change::Kind::kUncertain, true, path});
  }
  struct stat status = {};
  const bool there = lstat(path.c_str(), &status) == 0;
  listener.OnChange({there ? Change::Kind::kCreated : Change::Kind::kDeleted, false, path});
}

void FolderWatcher::OnRenamed(const FolderRecord& record, WatchListener& listener) {
  Id old_parent = tree_.ByKey(record.old_folder);
  Id parent = tree_.ByKey(record.folder);
  if (old_parent != kNone && !IsCovered(old_parent)) old_parent = kNone;
  if (parent != kNone && !IsCovered(parent)) parent = kNone;
  if (old_parent != kNone && parent != kNone) {
    listener.OnChange({Change::Kind::kRenamed, record.is_folder, tree_.Path(parent, record.name),
                       tree_.Path(old_parent, record.old_name)});
    if (record.is_folder) MoveFolder(old_parent, parent, record, listener);
  } else if (old_parent != kNone) {
    OnMovedAway(old_parent, record, listener);
  } else if (parent != kNone) {
    OnRecordIn(parent, {Kind::kCreated, record.is_folder, record.folder, record.name, 0, {}}, listener);
  }
}

/// Two names that are exchanged, one of them where nothing is watched, look like an arrival and a departure: whether
/// something is there is for the disk to say.
void FolderWatcher::OnMovedAway(Id parent, const FolderRecord& record, WatchListener& listener) {
  const Id child = tree_.Child(parent, record.old_name);
  const std::string path = tree_.Path(parent, record.old_name);
  struct stat status = {};
  const bool there = lstat(path.c_str(), &status) == 0;
  if (there) doubts_.push_back({tree_.RefOf(parent), std::string(record.old_name)});
  if (record.is_folder && child != kNone) RemoveFolder(child, listener);
  if (there) return listener.OnChange({Change::Kind::kUncertain, S_ISDIR(status.st_mode), path});
  listener.OnChange({Change::Kind::kDeleted, record.is_folder, path});
}

/// Moves the folder in the tree with all below it, which stays watched.
void FolderWatcher::MoveFolder(Id old_parent, Id parent, const FolderRecord& record, WatchListener& listener) {
  const Ref target = tree_.RefOf(parent);
  doubts_.push_back({tree_.RefOf(old_parent), std::string(record.old_name)});
  doubts_.push_back({target, std::string(record.name)});
  const Id folder = tree_.Child(old_parent, record.old_name);
  const Id replaced = tree_.Child(parent, record.name);
  if (folder == kNone) {  // seen by a listing in its new place already, or never: the place is looked at
    if (replaced == kNone) OnFolderCreated(parent, record.name, listener);
    return;
  }
  if (folder == replaced) return;
  const Ref moved = tree_.RefOf(folder);
  const bool same_rules = HaveSameRules(old_parent, parent);
  if (replaced != kNone) RemoveFolder(replaced, listener);
  const bool as_told = tree_.Get(moved) != kNone && tree_.Get(target) != kNone &&
                       tree_.Child(parent, record.name) == kNone && !tree_.IsWithin(parent, folder);
  if (!as_told || !same_rules || !IsWanted(parent, record.name)) {
    if (tree_.Get(moved) != kNone) RemoveFolder(folder, listener);
    if (tree_.Get(target) != kNone) OnFolderCreated(parent, record.name, listener);
    return;
  }
  const std::vector<std::string> roots = DetachRoots(folder);
  tree_.Move(folder, parent, record.name);
  tree_.Set(folder, FolderTree::kMoved, true);
  moved_.push_back(tree_.RefOf(folder));
  ReattachRoots(roots, listener);
}

void FolderWatcher::OnSelf(const FolderRecord& record, WatchListener& listener) {
  const Id id = tree_.ByKey(record.folder);
  if (id == kNone) return;
  if (record.kind == Kind::kSelfGone) tree_.SetKey(id, 0);
  const bool told_by_parent = id != FolderTree::kTop && IsCovered(tree_.Parent(id));
  const bool is_root_gone = record.kind == Kind::kSelfGone && tree_.Has(id, FolderTree::kRoot);
  if (!told_by_parent || is_root_gone) {
    Disturb(id, listener);
  } else if (record.kind == Kind::kSelfGone) {
    checks_.push_back({tree_.RefOf(id), false});
  }
}

void FolderWatcher::OnLost(WatchListener& listener) {
  listener.OnLost();
  for (const auto& [path, root] : roots_) StartWalk(path);
}

/// Looks again at the folder and those in it that could not be read; with the top, at all of them.
void FolderWatcher::RetryUnreadable(Id folder) {
  if (folder == kNone) return;
  std::erase_if(unreadable_, [this](Ref ref) {
    const Id id = tree_.Get(ref);
    return id == kNone || !tree_.Has(id, FolderTree::kUnreadable);
  });
  for (const Ref ref : unreadable_) {
    if (folder == FolderTree::kTop || folder == ref.id || tree_.Parent(ref.id) == folder) {
      checks_.push_back({ref, false});
    }
  }
}

}  // namespace ferrox::notifyd
