#pragma once

#include <cstdint>
#include <string>

#include "services/fileindexd/interruption.h"

namespace ferrox::indexd {

/// The files of one share's queue, as its worker and its status see them: the live queue, which others append to, and
/// the detached one, which a pass works on (fileindex/queue/queue_file.h). Has no state beyond the paths; safe for
/// several threads.
class ShareQueue {
 public:
  explicit ShareQueue(const std::string& path);

  /// Of the live queue, and of the detached one.
  const std::string& Path() const { return path_; }
  const std::string& DetachedPath() const { return detached_path_; }

  /// Whether the live queue holds anything.
  bool HasLines() const;
  /// Whether a detached queue is there, of a pass that is under way or was cut short.
  bool IsDetached() const;
  /// How many lines wait; of a long queue, as many as its first MiB lets expect.
  uint64_t CountLines() const;
  uint64_t CountDetachedLines() const;
  /// When the oldest queued change happened, in seconds since the epoch; 0 without a queue.
  int64_t OldestChange() const;

  /// Appends the event of a management operation (fileindex::AddCustomEvent).
  /// @return false when the live queue holds a damaged line and takes no event before it has been worked off.
  /// @throws Error as AddCustomEvent does otherwise.
  bool Add(int event, const std::string& path) const;
  /// Waits while a writer holds the lock of the live queue, up to 0.2 s. A writer holds it for an instant, but who
  /// detaches the queue and meets one would try again only after some tenths of a second. @throws Interrupted.
  void AwaitWriter(const Interruption& interruption) const;

 private:
  std::string path_;
  std::string detached_path_;
};

}  // namespace ferrox::indexd
