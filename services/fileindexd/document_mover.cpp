#include "services/fileindexd/document_mover.h"

#include <filesystem>

#include <kova/content_extract.h>

#include "common/error.h"
#include "common/file_util.h"

namespace ferrox::indexd {

namespace {

bool IsAtOrBelow(const std::string& path, const std::string& folder) {
  return StringStartWith(path + "/", folder + "/");
}

}  // namespace

void DocumentMover::Move(const std::string& path, const std::string& old_path) {
  if (IsAtOrBelow(path, old_path) || IsAtOrBelow(old_path, path)) return;
  for (const std::string& top : IndexedTopsOf(path)) {
    interruption_.Check();
    const std::string old_top = old_path + top.substr(path.size());
    if (!HoldsDocumentsOf(old_top, top)) continue;
    writer_.WillChange();
    try {
      index_.Rename(top, old_top);
    } catch (const Error& error) {
      if (error.Code() != Error::kEngineNoSuchDocument) throw;
    }
  }
}

/// The paths that have documents, at or below one that was renamed, without those below another of them.
std::vector<std::string> DocumentMover::IndexedTopsOf(const std::string& path) {
  if (rules_.PlaceOf(path) == PathRules::Place::kOutside) return {};
  return path == root_ && rules_.CanBeIndexed(path) ? EntriesOfRoot() : folders_.Topmost(path);
}

/// The root itself has no document that the engine could move with all below it.
std::vector<std::string> DocumentMover::EntriesOfRoot() const {
  std::vector<std::string> entries;
  std::error_code error;
  for (std::filesystem::directory_iterator at(root_, error), end; !error && at != end; at.increment(error)) {
    entries.push_back(at->path().string());
  }
  return entries;
}

/// Whether what the index has at the old path is what is at the new one now. When that has gone on to yet another
/// place, a later rename will tell; the documents are its, unless there is something new at the old path.
bool DocumentMover::HoldsDocumentsOf(const std::string& old_path, const std::string& path) {
  using namespace KOVA::CONTENT_EXTRACT;  // NOLINT: its functions of stamps
  struct stat status = {};
  const auto indexed = index_.Find(old_path);
  if (indexed.empty()) return false;
  if (LookAt(path, status) == Presence::kThere) return SameFile(indexed.front().stamp, Stamp(status));
  return LookAt(old_path, status) == Presence::kGone;
}

}  // namespace ferrox::indexd
