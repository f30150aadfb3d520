#pragma once

#include <sys/stat.h>

#include <cstddef>
#include <cstdint>
#include <optional>
#include <unordered_set>

#include "services/kovanotifyd/fan_group.h"

namespace ferrox::notifyd {

class MountedFolders;

/// Finds out which changes of files have to be told of by the file's number, since the name of the record says nothing
/// of them: the file has other names, or has lost that one since. All other files are looked at once, however often
/// they are written to, and new ones not at all: the kernel tells when the number of a file's links changes, before it
/// tells of the name that came.
class LinkedFiles {
 public:
  explicit LinkedFiles(MountedFolders& mounts) : mounts_(mounts) {}

  /// A record says that the number of the file's links changed.
  void OnLinks(const HandleKey& file);
  /// The number of the file that the record tells a change of, when it has to be told; 0 when not. Nothing when that
  /// cannot be found out.
  std::optional<uint64_t> NumberToReport(const FanRecord& record);
  /// Nothing is waiting in the kernel.
  void Rest();
  /// Records may have been lost.
  void Clear();

 private:
  static constexpr size_t kFilesMax = 4096;

  void NoteAlone(const HandleKey& file);
  std::optional<uint64_t> LookAt(const FanRecord& record);

  MountedFolders& mounts_;
  std::unordered_set<HandleKey> alone_;   ///< files that had one name, that of their records
  std::unordered_set<HandleKey> linked_;  ///< whose number of links changed since nothing was waiting,
  bool has_forgotten_ = false;            ///< or not all of them
};

}  // namespace ferrox::notifyd
