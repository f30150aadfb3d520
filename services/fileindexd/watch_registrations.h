#pragma once

#include <map>
#include <string>

namespace ferrox::indexd {

/// Keeps what the notification daemon is asked to watch in step with the indexed folders. The management operations
/// register what they change themselves, but not all of them: a share that was renamed or moved, or a user's renamed
/// home, is registered under its old paths until it is looked at here. Belongs to one thread at a time.
class WatchRegistrations {
 public:
  /// Registers the folders of every indexed share, as they are now, and takes back what this object registered for
  /// shares that are not indexed any more, or lie elsewhere. What is registered as it should be costs a look. What
  /// cannot be registered is logged and tried again the next time. @throws Error when the folders cannot be told.
  void Reconcile();

 private:
  std::map<std::string, std::string> queue_of_share_;  ///< of what is registered
};

}  // namespace ferrox::indexd
