#pragma once

#include <functional>
#include <map>
#include <set>
#include <string>
#include <vector>

#include "base/unique_fd.h"
#include "services/kovanotifyd/queues/queue_watch.h"

namespace ferrox::notifyd {

/// What one application wants to have written into one queue.
struct Registration {
  std::string application;  ///< its name, for the status
  std::string queue;        ///< the full path of the queue's file
  std::vector<QueueWatch> watches = {};
};

/// All registrations, and a sentence for each entry that cannot be used.
struct Registry {
  std::vector<Registration> list = {};
  std::vector<std::string> problems = {};

  /// The watches of each queue, by its path: several applications may share a queue.
  std::map<std::string, std::vector<QueueWatch>> Queues() const;
};

/// Reads all of the registry from disk. Problems are part of the result; it does not throw for them.
using ReadRegistry = std::function<Registry()>;

/// Notices changes of the registry's folder (docs/formats/notifyd.md): its files are replaced and removed, not changed.
class RegistryWatch {
 public:
  /// Makes the folder when it is missing.
  explicit RegistryWatch(std::string folder);

  /// Readable after a change; -1 where changes cannot be noticed.
  int Fd() const { return inotify_.Get(); }
  /// Drops what Fd has to report, and watches the folder that is at the path now, which may be a new one. To be called
  /// before each reading of the registry.
  void Rearm();

 private:
  std::string folder_;
  base::UniqueFd inotify_;
};

/// The registry as it was last read. Belongs to one thread.
class RegistryReader {
 public:
  RegistryReader(std::string folder, ReadRegistry read) : watch_(std::move(folder)), read_(std::move(read)) {}

  /// Readable when the registry should be read again; -1 where that cannot be noticed.
  int Fd() const { return watch_.Fd(); }
  /// Reads the registry, and logs the problems that it did not have at the last reading.
  void Read();
  /// Empty before the first Read.
  const Registry& Current() const { return current_; }

 private:
  RegistryWatch watch_;
  ReadRegistry read_;
  Registry current_;
  std::set<std::string> logged_problems_;  ///< those of current_: each is logged when it appears
};

}  // namespace ferrox::notifyd
