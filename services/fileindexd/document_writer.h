#pragma once

#include <sys/stat.h>

#include <atomic>
#include <set>
#include <string>
#include <vector>

#include "common/error.h"
#include "services/fileindexd/access_recorder.h"
#include "services/fileindexd/interruption.h"
#include "services/fileindexd/share_folders.h"
#include "services/fileindexd/share_index.h"
#include "services/fileindexd/share_status.h"
#include "services/support/exclusions.h"

namespace ferrox::indexd {

/// Brings single documents in line with their files: every write of the daemon goes through here to the index. A file
/// that cannot be indexed is recorded in the status and passed over; @throws Error when the index cannot be written or
/// content extraction as a whole does not work. Every call is safe from several threads.
class DocumentWriter {
 public:
  /// All outlive it.
  DocumentWriter(ShareIndex& index, const ShareFolders& folders, services::Exclusions& exclusions, ShareStatus& status)
      : index_(index), folders_(folders), exclusions_(exclusions), status_(status), access_(index, status) {}

  /// Whether the document needs nothing: it has the stamp of the file's present state and a record of its rights, and
  /// holds its content exactly when that is wanted and as well as the present readers can read it.
  bool IsCurrent(const IndexedEntry& indexed, const struct stat& status) const;
  /// Whether the content of the file at `path` is to be in its document.
  bool WantsContent(const std::string& path, const struct stat& status) const;
  /// Whether content that was not read, or not all of it, by that version may be readable now.
  static bool IsWorthAnotherTry(const UnreadContent& unread);
  /// Whether nothing is wrong with the document but its rights and what comes with these, so that RecordAccess makes it
  /// current.
  bool LacksAccessAlone(const IndexedEntry& indexed, const struct stat& status) const;

  /// Writes the whole document of what is at the path, or removes it when there is nothing. Rights that change
  /// meanwhile are recorded, although their event may have come before there was a document.
  void Write(const std::string& path);
  /// Records the rights that files and folders have now, and reads nothing else of them (AccessRecorder). Paths of
  /// which more has to be refreshed are returned: RefreshAttributes does it.
  std::set<std::string> RecordAccess(const std::vector<std::string>& paths);
  /// As Write, but leaves the content alone, so that the file is not read, when that cannot make an old content look
  /// like a new one.
  void RefreshAttributes(const std::string& path);
  /// The same after a rename, which changes the moved entry itself and, with another extension, the way in which its
  /// content is read. Does nothing when it is gone already: a later operation knows its present place and still needs
  /// the document.
  void RefreshRenamed(const std::string& path, const std::string& old_path);
  void Remove(const std::string& path) { Remove(std::vector<std::string>{path}, false); }
  /// The documents at the paths, and, with `and_below`, all below them, in one request.
  void Remove(const std::vector<std::string>& paths, bool and_below);
  /// All documents below a path, a thousand at a time. @throws Interrupted.
  void RemoveBelow(const std::string& folder, const Interruption& interruption);
  /// The document at the path and all below it, at once. @throws Interrupted.
  void RemoveTree(const std::string& path, const Interruption& interruption);

  /// Makes all that was done durable, by whichever thread. @throws Error.
  void Commit();
  bool HasUncommitted() const { return uncommitted_; }
  /// To be called before the index is changed past this object.
  void WillChange() { uncommitted_ = true; }

 private:
  bool HoldsContentAsWanted(const IndexedEntry& indexed, const struct stat& status) const;
  void RecordChangedSince(const struct stat& before, const std::string& access, const std::string& path);
  void RecordFailure(const Error& error, const std::string& path);

  ShareIndex& index_;
  const ShareFolders& folders_;
  services::Exclusions& exclusions_;
  ShareStatus& status_;
  AccessRecorder access_;
  std::atomic<bool> uncommitted_{false};
};

}  // namespace ferrox::indexd
