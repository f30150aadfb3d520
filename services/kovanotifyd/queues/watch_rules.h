#pragma once

#include <cstddef>
#include <cstdint>
#include <map>
#include <string>
#include <string_view>
#include <vector>

#include "base/path_table.h"
#include "services/kovanotifyd/queues/queue_router.h"

namespace ferrox::notifyd {

/// Which queues want to hear of a path, and of which kinds of changes. A lookup costs a hash for each component that
/// the path shares with a watched folder, however many folders are watched.
class WatchRules {
 public:
  /// A queue, by its place among the queues' names in order, that watches a path.
  struct Match {
    size_t queue = 0;
    uint32_t mask = 0;
    size_t root_size = 0;  ///< the watched folder is the path cut to that length
  };

  WatchRules() = default;
  explicit WatchRules(const std::map<std::string, std::vector<QueueWatch>>& queues);

  /// One match for each queue with the path in a watched folder and not ignored there, in the order of the queues. Of
  /// several watched folders of a queue the one nearest to the path decides. The result lives until the next call.
  const std::vector<Match>& MatchesOf(std::string_view path) { return Collect(path, matches_); }
  /// The same, in a place of its own, so that both sides of a rename can be looked at together.
  const std::vector<Match>& MatchesOfOld(std::string_view path) { return Collect(path, old_matches_); }

  /// Calls `visit` with the queue and the path of each watched folder below (not at) the path.
  template <typename Visit>
  void VisitBelow(const std::string& path, const Visit& visit) const {
    const std::string prefix = path == "/" ? path : path + "/";
    for (auto at = by_path_.lower_bound(prefix); at != by_path_.end() && at->first.starts_with(prefix); ++at) {
      for (const size_t queue : at->second) visit(queue, at->first);
    }
  }

 private:
  struct Rule {
    size_t queue = 0;
    uint32_t mask = 0;
    size_t root_size = 0;
    std::vector<std::string> ignore = {};
  };

  const std::vector<Match>& Collect(std::string_view path, std::vector<Match>& matches);
  static void Add(size_t queue, const QueueWatch& watch, std::map<std::string, std::vector<Rule>>& rules);

  base::PathTable<std::vector<Rule>> rules_;  // by the watched folder; "" is the file system's root
  std::map<std::string, std::vector<size_t>> by_path_;
  std::vector<uint64_t> seen_;  // by queue: the look-up that met it last
  uint64_t lookup_ = 0;
  std::vector<Match> matches_;
  std::vector<Match> old_matches_;
};

}  // namespace ferrox::notifyd
