#pragma once

#include <functional>
#include <map>
#include <string>
#include <vector>

#include "base/unique_fd.h"
#include "services/kovanotifyd/queues/queue_watch.h"

namespace ferrox::notifyd {

/// What one application wants to have written into one queue.
struct Registration {
  std::string application;
  std::string queue;
  std::vector<QueueWatch> watches = {};
};

/// All that is registered, and a sentence for each entry that cannot be used.
struct Registry {
  std::vector<Registration> list = {};
  std::vector<std::string> problems = {};

  /// By queue: several applications may share one.
  std::map<std::string, std::vector<QueueWatch>> Queues() const;
};

using ReadRegistry = std::function<Registry()>;

/// Tells when a file of the registry's folder was replaced or removed.
class RegistryWatch {
 public:
  /// Makes the folder when it is missing.
  explicit RegistryWatch(std::string folder);

  /// Readable after a change; -1 where changes cannot be seen.
  int Fd() const { return inotify_.Get(); }
  /// Takes note of the changes so far. To be called before the registry is read, also without a change: the folder
  /// itself may have been replaced.
  void Rearm();

 private:
  std::string folder_;
  base::UniqueFd inotify_;
};

}  // namespace ferrox::notifyd
