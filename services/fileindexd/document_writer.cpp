#include "services/fileindexd/document_writer.h"

#include <utility>

#include <kova/content_extract.h>
#include <kova/content_type.h>

#include "common/file_util.h"
#include "services/fileindexd/file_presence.h"

namespace ferrox::indexd {

using KOVA::CONTENT_EXTRACT::Access;
using KOVA::CONTENT_EXTRACT::ExtractVersion;
using KOVA::CONTENT_EXTRACT::SameContent;
using KOVA::CONTENT_EXTRACT::Stamp;

namespace {

constexpr unsigned kRemovedAtOnce = 1000;

/// Whether the content was found to be of another type than the name suggests. A refresh of the attributes alone would
/// put the name's type in its place.
bool DiffersFromNameType(const IndexedEntry& indexed, const std::string& path) {
  const char* by_name = kova::content::TypeByExtension(GetFileExtension(Basename(path), true));
  return indexed.with_content && by_name != nullptr && !indexed.content_type.empty() && indexed.content_type != by_name;
}

}  // namespace

bool DocumentWriter::WantsContent(const std::string& path, const struct stat& status) const {
  return !S_ISDIR(status.st_mode) && folders_.WantsContent(path) && !exclusions_.HidesContent(path);
}

bool DocumentWriter::IsCurrent(const IndexedEntry& indexed, const struct stat& status) const {
  return indexed.stamp == Stamp(status) && indexed.has_access && HoldsContentAsWanted(indexed, status);
}

bool DocumentWriter::LacksAccessAlone(const IndexedEntry& indexed, const struct stat& status) const {
  return SameContent(indexed.stamp, Stamp(status)) && HoldsContentAsWanted(indexed, status);
}

/// A file that broke its reader is not tried again by the same one.
bool DocumentWriter::IsWorthAnotherTry(const UnreadContent& unread) {
  return unread.version < ExtractVersion(unread.type);
}

bool DocumentWriter::HoldsContentAsWanted(const IndexedEntry& indexed, const struct stat& status) const {
  const bool unread = indexed.with_content && (indexed.extract_failed || indexed.extract_version == 0);
  return indexed.with_content == WantsContent(indexed.path, status) && !indexed.cut_without_reason &&
         !(unread && IsWorthAnotherTry({indexed.content_type, indexed.extract_version}));
}

void DocumentWriter::Write(const std::string& path) {
  struct stat status = {};
  if (PresenceOf(path, status) == Presence::kGone) return Remove(path);
  try {
    WillChange();
    const bool with_content = WantsContent(path, status);
    const std::string access = Access(path, status);
    if (with_content) status_.FileRead();
    index_.Upsert(path, with_content);
    status_.DocumentsWritten();
    RecordChangedSince(status, access, path);
  } catch (const Error& error) {
    RecordFailure(error, path);
  }
}

void DocumentWriter::RefreshAttributes(const std::string& path) {
  struct stat status = {};
  if (PresenceOf(path, status) == Presence::kGone) return Remove(path);
  const auto indexed = index_.Find(path);
  const bool same_content = !indexed.empty() && SameContent(indexed.front().stamp, Stamp(status)) &&
                            indexed.front().with_content == WantsContent(path, status);
  if (!same_content || DiffersFromNameType(indexed.front(), path)) return Write(path);
  try {
    WillChange();
    index_.Attr(path);
    status_.DocumentsWritten();
  } catch (const Error& error) {
    if (error.Code() == Error::kEngineNoSuchDocument) return Write(path);
    return RecordFailure(error, path);
  }
  // Written to meanwhile, the document would have the stamp of the new content beside the text of the old.
  struct stat now = {};
  const bool still = PresenceOf(path, now) == Presence::kThere && SameContent(Stamp(now), Stamp(status));
  if (!still) return Write(path);
  if (!SameRights(status, now)) (void)RecordAccess({path});
}

/// What else changed meanwhile has an event of its own that is to come.
void DocumentWriter::RecordChangedSince(const struct stat& before, const std::string& access, const std::string& path) {
  struct stat now = {};
  if (PresenceOf(path, now) != Presence::kThere) return;
  if (!SameRights(before, now) || Access(path, now) != access) (void)RecordAccess({path});
}

std::set<std::string> DocumentWriter::RecordAccess(const std::vector<std::string>& paths) {
  WillChange();
  return access_.Record(paths);
}

void DocumentWriter::RefreshRenamed(const std::string& path, const std::string& old_path) {
  struct stat status = {};
  if (PresenceOf(path, status) != Presence::kThere) return;
  const bool same_kind = GetFileExtension(path, true) == GetFileExtension(old_path, true);
  same_kind ? RefreshAttributes(path) : Write(path);
}

/// Called in a catch block: records a failure that is the file's own, and throws one that is the engine's or that of
/// content extraction as a whole.
void DocumentWriter::RecordFailure(const Error& error, const std::string& path) {
  struct stat status = {};
  if (error.Code() == Error::kParseFailed) {
    const std::string problem = KOVA::CONTENT_EXTRACT::ExtractionProblem();
    if (!problem.empty()) throw Error(Error::kParseFailed, problem);
    if (PresenceOf(path, status) == Presence::kGone) return Remove(path);
    return status_.AddFailure("cannot be examined", path);
  }
  if (error.Code() != Error::kEngineBadRequest) throw;
  status_.AddFailure(error.what(), path);
}

void DocumentWriter::Remove(const std::vector<std::string>& paths, bool and_below) {
  WillChange();
  index_.Delete(paths, and_below);
  status_.DocumentsDeleted(paths.size());
}

void DocumentWriter::RemoveBelow(const std::string& folder, const Interruption& interruption) {
  for (bool more = true; more;) {
    interruption.Check();
    std::vector<std::string> paths;
    for (IndexedEntry& entry : index_.List(folder, "", kRemovedAtOnce)) paths.push_back(std::move(entry.path));
    more = paths.size() == kRemovedAtOnce;
    if (!paths.empty()) Remove(paths, false);
  }
}

void DocumentWriter::RemoveTree(const std::string& path, const Interruption& interruption) {
  interruption.Check();
  Remove(std::vector<std::string>{path}, true);
}

void DocumentWriter::Commit() {
  uncommitted_ = false;
  index_.Commit();
  status_.Committed();
}

}  // namespace ferrox::indexd
