#pragma once

#include <cstddef>
#include <unordered_map>

#include "services/kovanotifyd/fan_group.h"
#include "services/kovanotifyd/filesystem/folder_locator.h"
#include "services/kovanotifyd/filesystem/mounted_folders.h"
#include "services/kovanotifyd/filesystem/record_window.h"

namespace ferrox::notifyd {

/// The kernel's records on their way: reads them into a window, from which they are taken one by one. The FolderLocator
/// has more of them read while one is worked on, to see which folders later records move.
class RecordQueue : public FolderSource {
 public:
  /// Reads at most `records_max` records ahead.
  RecordQueue(FanGroup& group, MountedFolders& mounts, size_t records_max)
      : group_(group), mounts_(mounts), records_max_(records_max) {}

  RecordWindow& Window() { return window_; }
  /// Reads one batch into the window; false when nothing was waiting.
  bool ReadBatch();

  // For the locator:
  Answer ReadPlace(const HandleKey& folder, FolderPlace& place) override;
  void Drain(RecordWindow& window) override;

  /// A folder was made and removed, in one record: its place is known until the records of what was done in it, which
  /// are still to come, have been worked on.
  void NoteRemoved(const HandleKey& folder, const FolderPlace& place);
  /// A folder was moved: corrects its place if it is one of those.
  void NoteMoved(const HandleKey& folder, const FolderPlace& place);

  /// Whether Drain reached the limit, so that places may be wrong. Clears the window then: its records count as lost.
  bool DropIfOverrun();
  /// Nothing is waiting: gives memory back that only a burst of records takes, so that an idle daemon is small.
  void Rest();

 private:
  FanGroup& group_;
  MountedFolders& mounts_;
  const size_t records_max_;
  RecordWindow window_;
  std::unordered_map<HandleKey, FolderPlace> removed_;
  bool is_overrun_ = false;
  bool was_burst_ = false;
};

}  // namespace ferrox::notifyd
