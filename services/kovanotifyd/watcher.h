#pragma once

#include <chrono>
#include <cstdint>
#include <string>
#include <vector>

#include "services/kovanotifyd/change.h"

namespace ferrox::notifyd {

/// A folder that is to be watched with all below it.
struct WatchRoot {
  /// Absolute, real (no link on the way), without a trailing "/".
  std::string path;
  /// Names of folders, anywhere below the root, that need not be watched, nor anything below them. A watcher may report
  /// changes there nevertheless.
  std::vector<std::string> ignore = {};
};

/// Gets what a watcher reports. Called on the thread that calls the watcher, only during Read and Advance.
class WatchListener {
 public:
  virtual ~WatchListener() = default;

  /// Changes come in the order in which the kernel reported them.
  virtual void OnChange(Change change) = 0;
  /// Everything that happens at and below the root from now on is reported; what happened before has to be found by a
  /// comparison of disk and index. Called once for each root that was added, and for all roots after OnLost, when all
  /// is watched again.
  virtual void OnCovered(const std::string& root) = 0;
  /// The watcher cannot watch the root, or no longer can, and has removed it. `reason` is a short sentence for people,
  /// without a full stop, such as "needs the capability CAP_SYS_ADMIN".
  virtual void OnRefused(const std::string& root, const std::string& reason) = 0;
  /// The kernel dropped changes, since its queue was full. OnCovered follows for each root.
  virtual void OnLost() = 0;
  /// The root, or a folder above it, was moved, removed, replaced or unmounted, or may have been. The caller examines
  /// what is at the path, and adds the root again if it is another folder now.
  virtual void OnRootDisturbed(const std::string& root) = 0;
  /// Everything that had happened when the cookie file (see Watcher) was last touched has been reported.
  virtual void OnCookie() = 0;
};

/// One way to learn of changes below folders. Belongs to one thread; no call blocks longer than a few system calls on
/// local files take.
///
/// The cookie shows how far a watcher has read: a regular file outside of all roots whose times the daemon sets
/// (cookie.h). The watcher, which got its path when it was made, reports that change by OnCookie in its order among the
/// others. The daemon does not touch it again before that.
class Watcher {
 public:
  virtual ~Watcher() = default;

  /// As people read it in the status: "fanotify", "fanotify inode marks", "inotify".
  virtual const char* Name() const = 0;

  /// Begins to watch a root; a later Advance reports the outcome by OnCovered or OnRefused. Roots may lie in each
  /// other. A root that is added again, with other names to ignore or for another folder at its path, is set up anew.
  virtual void Add(const WatchRoot& root) = 0;
  /// Ends that. Changes that the kernel has queued may yet be reported.
  virtual void Remove(const std::string& root) = 0;

  /// Becomes readable when Read has something to do; -1 while there is nothing.
  virtual int Fd() const = 0;
  /// Reports what has happened, a few thousand changes at most; returns false when there was nothing to read.
  virtual bool Read(WatchListener& listener) = 0;
  /// Goes on with what takes time: walking through roots to watch their folders, at first and after a loss. Returns
  /// after about `at_most`; false when nothing is left to do.
  virtual bool Advance(std::chrono::milliseconds at_most, WatchListener& listener) = 0;

  /// Whether each folder has a watch of its own: then folders that a mount hides have none, and the root has to be
  /// added again when that is unmounted.
  virtual bool WatchesEachFolder() const { return false; }
  /// How many watches of the kernel the root takes.
  virtual uint64_t Watches(const std::string& root) const = 0;
};

}  // namespace ferrox::notifyd
