#include "services/fileindexd/document_mover.h"

#include <filesystem>

#include <kova/content_extract.h>

#include "base/path.h"
#include "common/error.h"
#include "services/fileindexd/file_presence.h"

namespace ferrox::indexd {

using KOVA::CONTENT_EXTRACT::SameFile;
using KOVA::CONTENT_EXTRACT::Stamp;

namespace {

/// How many documents are tried for one whose file is in the share still: others may have been deleted or replaced.
constexpr unsigned kSampledDocuments = 1000;

bool IsFolder(const std::string& path) {
  struct stat status = {};
  return PresenceOf(path, status) == Presence::kThere && S_ISDIR(status.st_mode);
}

std::vector<std::string> EntriesOf(const std::string& folder) {
  std::vector<std::string> entries;
  std::error_code error;
  for (std::filesystem::directory_iterator at(folder, error), end; !error && at != end; at.increment(error)) {
    entries.push_back(at->path().string());
  }
  return entries;
}

}  // namespace

std::vector<DocumentMover::Step> DocumentMover::StepsOf(const std::string& path, const std::string& old_path) {
  std::vector<Step> steps;
  if (base::IsAtOrBelow(path, old_path) || base::IsAtOrBelow(old_path, path)) return steps;
  for (const std::string& top : IndexedTopsOf(path)) steps.push_back({top, old_path + top.substr(path.size())});
  return steps;
}

/// Of a document of the folder's old place, what comes below the folder leads to the same file at the new one.
std::string DocumentMover::RootBeforeMove(const std::string& top) {
  struct stat status = {};
  for (const IndexedEntry& document : index_.List(top, "", kSampledDocuments)) {
    const std::string& path = document.path;
    for (size_t end = top.size(); end != std::string::npos; end = path.find('/', end + 1)) {
      const bool is_there = PresenceOf(root_ + path.substr(end), status) == Presence::kThere;
      if (is_there && SameFile(document.stamp, Stamp(status))) return path.substr(0, end);
    }
  }
  return "";
}

bool DocumentMover::DescribesFile(const std::string& path, const struct stat& status) {
  const auto indexed = index_.Find(path);
  return !indexed.empty() && SameFile(indexed.front().stamp, Stamp(status));
}

void DocumentMover::Move(const Step& step) {
  const auto& [path, old_path] = step;
  interruption_.Check();
  const std::optional<std::string> stamp = StampOfDocument(old_path, path);
  if (!stamp.has_value()) return;
  writer_.WillChange();
  try {
    index_.Move(path, old_path, *stamp);
    if (IsFolder(path)) moved_folder_ = true;
  } catch (const Error& error) {
    if (error.Code() != Error::kEngineNoSuchDocument) throw;
  }
}

/// The paths that have documents, at or below one that was renamed, without those below another of them. The root
/// itself has no document that the engine could move with all below it.
std::vector<std::string> DocumentMover::IndexedTopsOf(const std::string& path) {
  if (rules_.PlaceOf(path) == PathRules::Place::kOutside) return {};
  return path == root_ && rules_.CanBeIndexed(path) ? EntriesOf(root_) : folders_.Topmost(path);
}

/// The stamp of the document at the old path, if that is of what is at the new one now. When that has gone on to yet
/// another place, a later rename names that; the documents are its, unless there is something new at the old path.
std::optional<std::string> DocumentMover::StampOfDocument(const std::string& old_path, const std::string& path) {
  struct stat status = {};
  auto indexed = index_.Find(old_path);
  if (indexed.empty()) return std::nullopt;
  const bool is_there = PresenceOf(path, status) == Presence::kThere;
  const bool same =
      is_there ? SameFile(indexed.front().stamp, Stamp(status)) : PresenceOf(old_path, status) == Presence::kGone;
  return same ? std::optional<std::string>(std::move(indexed.front().stamp)) : std::nullopt;
}

}  // namespace ferrox::indexd
