#pragma once

#include <sys/stat.h>

#include <set>
#include <string>
#include <vector>

#include "services/fileindexd/share_index.h"
#include "services/fileindexd/share_status.h"

namespace ferrox::indexd {

/// Whether two examinations found the same owner, group, mode and ctime. The ctime tells of an ACL, too, but its ticks
/// are some milliseconds.
bool SameRights(const struct stat& a, const struct stat& b);

/// Records the rights of files and folders as they are now: one request for many, and no content is read. Several
/// threads record those of one file at the same time: rights are compared again after they were recorded, so that none
/// leaves older ones than another has recorded before. Every call is safe from several threads.
class AccessRecorder {
 public:
  /// Both outlive it.
  AccessRecorder(ShareIndex& index, ShareStatus& status) : index_(index), status_(status) {}

  /// Records the rights of at most 10,000 paths, of folders without a document as well. @return those paths of which
  /// more is to be done: there is no document, or one of another content, or no file, or the engine refuses it.
  /// @throws Error when the index cannot be written.
  std::set<std::string> Record(std::vector<std::string> paths);

 private:
  struct Seen {
    std::vector<wire::SeenAccess> records;
    std::vector<struct stat> status;  ///< of each
  };

  static Seen Examine(const std::vector<std::string>& paths, std::set<std::string>& left);
  void Send(const Seen& seen, std::set<std::string>& left);
  static std::vector<std::string> ChangedSince(const Seen& seen);

  ShareIndex& index_;
  ShareStatus& status_;
};

}  // namespace ferrox::indexd
