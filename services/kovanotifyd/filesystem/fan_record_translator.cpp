#include "services/kovanotifyd/filesystem/fan_record_translator.h"

#include <algorithm>
#include <optional>
#include <utility>

namespace ferrox::notifyd {

namespace {

using ChangeKind = Change::Kind;

/// Changes in a file, rather than of its names.
constexpr uint64_t kFileMask = FAN_MODIFY | FAN_CLOSE_WRITE | FAN_ATTRIB;

void Report(WatchListener& listener, ChangeKind kind, const FanRecord& record, const std::string& path,
            const std::string& old_path = {}) {
  listener.OnChange({kind, record.IsFolder(), path, old_path});
}

}  // namespace

bool ExchangeDetector::IsSecond(const FanRecord& record) {
  const bool is_second = has_last_ && target_ != record.target && folder_ == record.new_folder &&
                         new_folder_ == record.folder && name_ == record.new_name && new_name_ == record.name;
  has_last_ = true;
  folder_ = record.folder;
  name_ = record.name;
  new_folder_ = record.new_folder;
  new_name_ = record.new_name;
  target_ = record.target;
  return is_second;
}

void FanRecordTranslator::Translate(const FanRecord& record, WatchListener& listener) {
  if (parts_.marks.IsCookie(record)) return listener.OnCookie();
  if (record.folder.empty()) return ReportLinks(record, listener);
  if ((record.mask & FAN_RENAME) != 0) {
    TranslateRename(record, listener);
  } else {
    TranslateName(record, listener);
    exchanges_.Clear();
  }
  if (!record.IsFolder() || (record.mask & (FAN_RENAME | FAN_DELETE)) == 0) return;
  for (const std::string& root : parts_.roots.At(record.target)) listener.OnRootDisturbed(root);
}

/// The kernel joins changes of one name and object in one record. Which came first can mostly be told, but whether a
/// name that was both made and removed is there now has to be read from disk.
void FanRecordTranslator::TranslateName(const FanRecord& record, WatchListener& listener) {
  const uint64_t mask = record.mask;
  const bool is_in_quiet = parts_.finder.Find(record.folder, record.name, paths_, listener);
  if ((mask & FAN_CREATE) != 0 && record.IsFolder()) NoteNewFolder(record);
  if (is_in_quiet) parts_.marks.Ignore(record);
  if (!is_in_quiet && !record.IsFolder() && (mask & kFileMask) != 0) ReportByNumber(record, listener);
  if (paths_.empty()) return ReportAboveRoots(record, listener);
  parts_.history.NoteName(record.target);

  if ((mask & FAN_DELETE) != 0 && ReportDeleted(record, listener)) return;
  for (const std::string& path : paths_) {
    if ((mask & (FAN_CREATE | FAN_DELETE)) != 0) Report(listener, ChangeKind::kCreated, record, path);
    if ((mask & FAN_CLOSE_WRITE) != 0) {
      Report(listener, ChangeKind::kWritten, record, path);
    } else if ((mask & FAN_MODIFY) != 0) {
      Report(listener, ChangeKind::kModified, record, path);
    }
    if ((mask & FAN_ATTRIB) != 0) Report(listener, ChangeKind::kAttributes, record, path);
  }
}

void FanRecordTranslator::NoteNewFolder(const FanRecord& record) {
  const FolderPlace place = {record.folder, std::string(record.name)};
  (void)parts_.locator.Place(record.target, place);
  if ((record.mask & FAN_DELETE) != 0) parts_.queue.NoteRemoved(record.target, place);
}

/// @return false when the name is there again, and what the record says beside the deletion counts too.
bool FanRecordTranslator::ReportDeleted(const FanRecord& record, WatchListener& listener) {
  for (const std::string& path : paths_) Report(listener, ChangeKind::kDeleted, record, path);
  const bool may_be_back = (record.mask & FAN_CREATE) != 0 || parts_.history.HasLeft(record.target);
  parts_.history.Note(record);
  if (!may_be_back || record.IsFolder()) return true;
  return !parts_.mounts.HasName(record.folder, record.name).value_or(false);
}

/// The queues of the roots may have the file under another name only.
void FanRecordTranslator::ReportByNumber(const FanRecord& record, WatchListener& listener) {
  const std::optional<uint64_t> file = parts_.linked.NumberToReport(record);
  if (!file.has_value()) return parts_.finder.ReportUncertain(record.folder, listener);
  const bool of_attributes = (record.mask & FAN_ATTRIB) != 0;
  ReportNumber(record, of_attributes ? ChangeKind::kAttributesByNumber : ChangeKind::kByNumber, *file, listener);
}

/// The number of a file's links changed, and with it the ctime that the index keeps of it. The record of the name that
/// came or went says nothing of the others, which may be the only ones in a root.
void FanRecordTranslator::ReportLinks(const FanRecord& record, WatchListener& listener) {
  parts_.linked.OnLinks(record.target);
  ReportNumber(record, ChangeKind::kAttributesByNumber, parts_.linked.NumberOf(record.target, 1), listener);
}

void FanRecordTranslator::ReportNumber(const FanRecord& record, ChangeKind kind, uint64_t file,
                                       WatchListener& listener) {
  if (file == 0) return;
  for (const std::string& root : parts_.roots.PathsOn(record.target)) listener.OnChange({kind, false, root, {}, file});
}

/// Who may not pass a folder may read nothing in the roots below it.
void FanRecordTranslator::ReportAboveRoots(const FanRecord& record, WatchListener& listener) {
  if (!record.IsFolder() || (record.mask & FAN_ATTRIB) == 0) return;
  for (const std::string& root : parts_.roots.At(record.name == "." ? record.folder : record.target)) {
    Report(listener, ChangeKind::kAttributes, record, root);
  }
}

void FanRecordTranslator::TranslateRename(const FanRecord& record, WatchListener& listener) {
  (void)parts_.finder.Find(record.folder, record.name, paths_, listener);
  (void)parts_.finder.Find(record.new_folder, record.new_name, new_paths_, listener);
  if (!paths_.empty() || !new_paths_.empty()) parts_.history.Note(record);
  if (record.IsFolder()) {
    const FolderPlace place = {record.new_folder, std::string(record.new_name)};
    if (parts_.locator.Place(record.target, place) == nullptr) {
      parts_.finder.ReportUncertain(record.new_folder, listener);
    }
    parts_.queue.NoteMoved(record.target, place);
  } else {  // its ctime is another one under all its names
    ReportNumber(record, ChangeKind::kAttributesByNumber, parts_.linked.NumberOf(record.target, 2), listener);
  }
  // What the first record of an exchange moved to the old name is there now: this one did not move it away.
  if (exchanges_.IsSecond(record)) paths_.clear();
  ReportRename(record, listener);
  // A link that was made at the old name afterwards may have been joined with an earlier record of it.
  if (record.IsFolder() || paths_.empty() || !parts_.history.MayHaveName(record.target)) return;
  if (!parts_.mounts.HasName(record.folder, record.name).value_or(false)) return;
  for (const std::string& path : paths_) Report(listener, ChangeKind::kCreated, record, path);
}

void FanRecordTranslator::ReportRename(const FanRecord& record, WatchListener& listener) {
  for (size_t i = 0; i < std::max(paths_.size(), new_paths_.size()); ++i) {
    if (i >= paths_.size()) {
      Report(listener, ChangeKind::kCreated, record, new_paths_[i]);
    } else if (i >= new_paths_.size()) {
      Report(listener, ChangeKind::kDeleted, record, paths_[i]);
    } else {
      Report(listener, ChangeKind::kRenamed, record, new_paths_[i], paths_[i]);
    }
  }
}

}  // namespace ferrox::notifyd
