#include "services/kovanotifyd/folders/folder_record_translator.h"

#include <sys/stat.h>

namespace ferrox::notifyd {

namespace {

using Kind = FolderRecord::Kind;

}  // namespace

void FolderRecordTranslator::Translate(const FolderRecord& record, WatchListener& listener) {
  if (record.kind == Kind::kLost) {
    listener.OnLost();
    return roots_.WalkAll();
  }
  if (record.kind == Kind::kRenamed) return OnRenamed(record, listener);
  if (record.kind == Kind::kSelfMoved || record.kind == Kind::kSelfGone) return OnFolderItself(record, listener);
  if (IsCookie(record)) OnCookieTouched(listener);
  const Id parent = CoveredFolder(record.folder);
  if (parent != kNoFolder) return OnRecordIn(parent, record, listener);
  if (record.kind == Kind::kAttributes && record.name.empty()) inspector_.RetryUnreadable(FolderTree::kTop);
}

bool FolderRecordTranslator::IsCookie(const FolderRecord& record) const {
  return record.kind == Kind::kAttributes && cookie_.folder != 0 && record.folder == cookie_.folder &&
         record.name == cookie_.name;
}

/// What is in doubt at this moment is reported first.
void FolderRecordTranslator::OnCookieTouched(WatchListener& listener) {
  queue_.HasDoubts() ? queue_.DeferCookie() : listener.OnCookie();
}

/// kNoFolder for the key of no folder of the tree, and for that of a passage, of which only its own moves matter.
FolderTree::Id FolderRecordTranslator::CoveredFolder(FolderKey key) const {
  const Id id = tree_.ByKey(key);
  return id != kNoFolder && tree_.IsCovered(id) ? id : kNoFolder;
}

void FolderRecordTranslator::OnRecordIn(Id parent, const FolderRecord& record, WatchListener& listener) {
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
      inspector_.RetryUnreadable(record.name.empty() ? parent : tree_.Child(parent, record.name));
      return listener.OnChange({Change::Kind::kAttributes, true, path});
    case Kind::kDeleted: {
      const Id child = is_folder ? tree_.Child(parent, record.name) : kNoFolder;
      if (child != kNoFolder) roots_.RemoveFolder(child, listener);
      return listener.OnChange({Change::Kind::kDeleted, is_folder, path});
    }
    case Kind::kUncertain:
      return OnUncertain(parent, record, listener);
    case Kind::kRenamed:
    case Kind::kSelfMoved:
    case Kind::kSelfGone:
    case Kind::kLost:
      break;
  }
}

/// The file may be known under another name, in any queue; or this name is gone, and with it the path by which the
/// change would have been found. Then the change is also reported by the file's number.
void FolderRecordTranslator::OnFileChanged(Change::Kind kind, const std::string& path, uint64_t number,
                                           WatchListener& listener) {
  listener.OnChange({kind, false, path});
  struct stat status = {};
  const bool is_there = lstat(path.c_str(), &status) == 0;
  const bool has_others = is_there && S_ISREG(status.st_mode) && status.st_nlink > 1;
  const bool is_gone = number != 0 && (!is_there || status.st_ino != number);
  if (!has_others && !is_gone) return;
  const uint64_t file = is_gone ? number : status.st_ino;
  const Change::Kind by_number =
      kind == Change::Kind::kAttributes ? Change::Kind::kAttributesByNumber : Change::Kind::kByNumber;
  for (const std::string& root : roots_.Paths()) listener.OnChange({by_number, false, root, {}, file});
}

/// Reported when it is watched, so that a comparison that follows the report misses nothing that is made in it.
void FolderRecordTranslator::OnFolderCreated(Id parent, std::string_view name, WatchListener& listener) {
  if (!roots_.FilterIn(parent).Wants(name)) {
    return listener.OnChange({Change::Kind::kCreated, true, tree_.Path(parent, name)});
  }
  Id child = tree_.Child(parent, name);
  if (child != kNoFolder &&
      tree_.Key(child) != 0) {  // found by a listing before its record was read, or another by now
    queue_.AddNameInDoubt(parent, name);
    return listener.OnChange({Change::Kind::kCreated, true, tree_.Path(child)});
  }
  if (child == kNoFolder) child = tree_.Add(parent, name);
  inspector_.InspectAndReport(child, false, listener);
}

void FolderRecordTranslator::OnUncertain(Id parent, const FolderRecord& record, WatchListener& listener) {
  const std::string path = tree_.Path(parent, record.name);
  if (record.is_folder) {
    queue_.AddNameInDoubt(parent, record.name);
    return listener.OnChange({Change::Kind::kUncertain, true, path});
  }
  struct stat status = {};
  const bool there = lstat(path.c_str(), &status) == 0;
  listener.OnChange({there ? Change::Kind::kCreated : Change::Kind::kDeleted, false, path});
}

void FolderRecordTranslator::OnRenamed(const FolderRecord& record, WatchListener& listener) {
  const Id old_parent = CoveredFolder(record.old_folder);
  const Id parent = CoveredFolder(record.folder);
  if (old_parent != kNoFolder && parent != kNoFolder) {
    listener.OnChange({Change::Kind::kRenamed, record.is_folder, tree_.Path(parent, record.name),
                       tree_.Path(old_parent, record.old_name)});
    if (record.is_folder) MoveFolder(old_parent, parent, record, listener);
  } else if (old_parent != kNoFolder) {
    OnMovedAway(old_parent, record, listener);
  } else if (parent != kNoFolder) {
    OnRecordIn(parent, {Kind::kCreated, record.is_folder, record.folder, record.name, 0, {}}, listener);
  }
}

/// An exchange of two names, one of them where nothing is watched, looks like a departure and an arrival: whether
/// something is at the old name now can only be seen on disk.
void FolderRecordTranslator::OnMovedAway(Id parent, const FolderRecord& record, WatchListener& listener) {
  const Id child = tree_.Child(parent, record.old_name);
  const std::string path = tree_.Path(parent, record.old_name);
  struct stat status = {};
  const bool there = lstat(path.c_str(), &status) == 0;
  if (there) queue_.AddNameInDoubt(parent, record.old_name);
  if (record.is_folder && child != kNoFolder) roots_.RemoveFolder(child, listener);
  if (there) return listener.OnChange({Change::Kind::kUncertain, S_ISDIR(status.st_mode), path});
  listener.OnChange({Change::Kind::kDeleted, record.is_folder, path});
}

/// Moves the folder in the tree with all below it, which stays watched. Where the tree does not have what the record
/// says, or other names are to be watched in the new place, the folder is removed and inspected there as a new one.
void FolderRecordTranslator::MoveFolder(Id old_parent, Id parent, const FolderRecord& record, WatchListener& listener) {
  const FolderTree::Ref target = tree_.RefOf(parent);
  queue_.AddNameInDoubt(old_parent, record.old_name);
  queue_.AddNameInDoubt(parent, record.name);
  const Id folder = tree_.Child(old_parent, record.old_name);
  const Id replaced = tree_.Child(parent, record.name);
  if (folder == kNoFolder) {  // a listing has found it in its new place already, or never
    if (replaced == kNoFolder) OnFolderCreated(parent, record.name, listener);
    return;
  }
  if (folder == replaced) return;
  const FolderTree::Ref moved = tree_.RefOf(folder);
  const bool same_names = roots_.FilterIn(old_parent) == roots_.FilterIn(parent);
  if (replaced != kNoFolder) roots_.RemoveFolder(replaced, listener);
  const bool can_move = tree_.Get(moved) != kNoFolder && tree_.Get(target) != kNoFolder &&
                        tree_.Child(parent, record.name) == kNoFolder && !tree_.IsWithin(parent, folder);
  if (!can_move || !same_names || !roots_.FilterIn(parent).Wants(record.name)) {
    if (tree_.Get(moved) != kNoFolder) roots_.RemoveFolder(folder, listener);
    if (tree_.Get(target) != kNoFolder) OnFolderCreated(parent, record.name, listener);
    return;
  }
  roots_.MoveFolder(folder, parent, record.name, listener);
  queue_.NoteMoved(folder);
}

/// Where a parent is covered, its own record of the name says the same and more.
void FolderRecordTranslator::OnFolderItself(const FolderRecord& record, WatchListener& listener) {
  const Id id = tree_.ByKey(record.folder);
  if (id == kNoFolder) return;
  if (record.kind == Kind::kSelfGone) tree_.SetKey(id, 0);
  const bool is_parent_covered = id != FolderTree::kTop && tree_.IsCovered(tree_.Parent(id));
  const bool is_root_gone = record.kind == Kind::kSelfGone && tree_.Has(id, FolderTree::kRoot);
  if (!is_parent_covered || is_root_gone) {
    roots_.Disturb(id, listener);
  } else if (record.kind == Kind::kSelfGone) {
    queue_.AddFolder(tree_.RefOf(id), false);
  }
}

}  // namespace ferrox::notifyd
