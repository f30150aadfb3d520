#pragma once

#include <map>
#include <string>

namespace ferrox::indexd {

/// Keeps the folders that the notification daemon is asked to watch in step with the indexed folders. Most management
/// operations register their change themselves; a share that was renamed or moved, or a user's renamed home, stays
/// registered under its old paths until the next Reconcile. Belongs to one thread at a time.
class WatchRegistrations {
 public:
  /// Registers the folders of every indexed share, as they are now, and takes back what this object registered for
  /// shares that are not indexed any more, or lie elsewhere. Writes nothing where the registry is as it should be. What
  /// cannot be registered is logged and tried again the next time. @throws Error when the folders cannot be read.
  void Reconcile();

 private:
  std::map<std::string, std::string> queue_of_share_;  ///< of what is registered
};

}  // namespace ferrox::indexd
