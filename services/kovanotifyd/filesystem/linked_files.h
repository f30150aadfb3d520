#pragma once

#include <sys/stat.h>

#include <cstddef>
#include <cstdint>
#include <optional>
#include <unordered_set>

#include "services/kovanotifyd/fan_group.h"

namespace ferrox::notifyd {

class MountedFolders;

/// Finds out which changes of files have to be reported by the file's number, since its name in the record is not
/// enough: the file has other names (hard links), or has lost that name since. Any other file is examined once, however
/// often it is written to, and a new one not at all: the kernel reports that the number of a file's links changed
/// before it reports the new name.
class LinkedFiles {
 public:
  explicit LinkedFiles(MountedFolders& mounts) : mounts_(mounts) {}

  /// The number of the file's links changed, says a record.
  void OnLinks(const HandleKey& file);
  /// The number of the file that the record is about, if its change has to be reported by it; 0 if not. Nothing when
  /// that cannot be found out.
  std::optional<uint64_t> NumberToReport(const FanRecord& record);
  /// The number of the file, if it is a regular one that is there and has at least so many names; else 0.
  uint64_t NumberOf(const HandleKey& file, unsigned names_min);
  /// To be called when no records are waiting: a file that is created after that has no links that were reported
  /// before.
  void Rest();
  /// To be called when records may have been lost.
  void Clear();

 private:
  static constexpr size_t kFilesMax = 4096;  ///< in each set; bounds memory

  void NoteAlone(const HandleKey& file);
  std::optional<uint64_t> Examine(const FanRecord& record);

  MountedFolders& mounts_;
  std::unordered_set<HandleKey> alone_;   ///< files that have one name, that in their records
  std::unordered_set<HandleKey> linked_;  ///< files whose number of links changed since the last Rest
  bool has_forgotten_ = false;            ///< whether linked_ lacks some of these
};

}  // namespace ferrox::notifyd
