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
  /// Names of folders that need not be watched, nor anything below them, wherever they are below the root.
  std::vector<std::string> ignore = {};
};

/// Whom a watcher tells. Called on the thread that calls the watcher, only during Read and Advance.
class WatchListener {
 public:
  virtual ~WatchListener() = default;

  /// In the order in which the kernel reported them.
  virtual void OnChange(Change change) = 0;
  /// Everything that happens at and below the root from now on is reported: what happened before is for a comparison of
  /// disk and index to find. Called once for each root added, and again for all of them after changes were lost and
  /// everything is watched again.
  virtual void OnCovered(const std::string& root) = 0;
  /// The watcher cannot watch the root, or cannot any more, and does not. `reason` is a short sentence for people
  /// without a full stop, such as "needs the capability CAP_SYS_ADMIN".
  virtual void OnRefused(const std::string& root, const std::string& reason) = 0;
  /// The kernel dropped changes. OnCovered follows for each root.
  virtual void OnLost() = 0;
  /// The root itself was moved, removed, replaced or unmounted, or something above it was, or might have been: it is to
  /// be examined, and added anew if it is another folder now.
  virtual void OnRootDisturbed(const std::string& root) = 0;
  /// All that had happened when the cookie file (see Watcher) was last touched has been reported.
  virtual void OnCookie() = 0;
};

/// One way to learn of changes below folders. Belongs to one thread; nothing blocks longer than a look at a few files.
/// Watchers are made with the path of a cookie file, a regular file that the daemon owns outside of all roots and whose
/// times it sets when it wants to know how far the watcher is; a watcher reports that change by OnCookie, in its place
/// between the others. The daemon never sets them again before it was reported.
class Watcher {
 public:
  virtual ~Watcher() = default;

  /// The way, in the words that people read in the status: "fanotify", "fanotify inode marks", "inotify".
  virtual const char* Name() const = 0;

  /// Begins to watch a root; what comes of it is told by OnCovered or OnRefused, in a later Advance. Roots may lie in
  /// each other. Adding a root again, with other names to ignore, or because it may be another folder now, begins anew.
  virtual void Add(const WatchRoot& root) = 0;
  /// Ends it. Changes still on their way may yet be reported.
  virtual void Remove(const std::string& root) = 0;

  /// Becomes readable when Read has something to do; -1 while there is nothing.
  virtual int Fd() const = 0;
  /// Reports what has happened, at most a few thousand changes at once; returns false when there was nothing to read.
  virtual bool Read(WatchListener& listener) = 0;
  /// Goes on with what takes time: finding folders to watch, watching them again after a loss. Returns after about
  /// `at_most`; false when nothing is left to do.
  virtual bool Advance(std::chrono::milliseconds at_most, WatchListener& listener) = 0;

  /// Whether folders that something mounted hides are not watched, so that a root is to be added anew when it goes.
  virtual bool WatchesEachFolder() const { return false; }
  /// How many watches the kernel keeps for the root.
  virtual uint64_t Watches(const std::string& root) const = 0;
};

}  // namespace ferrox::notifyd
