#pragma once

#include <chrono>
#include <map>
#include <string>
#include <vector>

#include "wire/frame_client.h"

namespace ferrox::wire {

/// What the two daemons say of whether the index has all that was changed before they were asked.
struct ChangesReport {
  /// The daemon without whose answer nothing can be said, one of the constants of common/paths.h, and what it gave
  /// instead; null: both have answered.
  const char* failed_socket = nullptr;
  Reply failure = {};
  /// What keeps the notification daemon from noticing changes, one sentence or several; "": nothing does.
  std::string not_noticed = {};
  /// The shares of which it cannot be said, by name, each with reason and remedy.
  std::map<std::string, std::string> behind = {};

  /// Whether anything can be said of any share.
  bool IsKnown() const { return failed_socket == nullptr && not_noticed.empty(); }
};

/// Waits until what was changed before this call in the shares (none named: in all that are worked on) is in the index:
/// first the notification daemon has everything that the system reported in the queues, then the index daemon has the
/// queues in the index. Blocks at most `longest` and some seconds; of that, `longest_indexing` at most for the latter.
/// Where it cannot be said of all shares together and none is named, the index daemon's refusal is the failure.
ChangesReport AwaitChanges(const std::vector<std::string>& shares, std::chrono::milliseconds longest,
                           std::chrono::milliseconds longest_indexing = std::chrono::hours(1));

}  // namespace ferrox::wire
