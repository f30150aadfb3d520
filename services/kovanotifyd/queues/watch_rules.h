#pragma once

#include <cstddef>
#include <cstdint>
#include <map>
#include <string>
#include <string_view>
#include <vector>

#include "base/path_table.h"
#include "services/kovanotifyd/queues/queue_watch.h"

namespace ferrox::notifyd {

/// Finds the queues that watch a path, and which kinds of changes each of them wants. A look-up hashes each component
/// of the path once as far as it may be that of a watched folder, however many folders are watched (base::PathTable).
/// Belongs to one thread.
class WatchRules {
 public:
  /// A queue that watches a path.
  struct Match {
    size_t queue = 0;  ///< its index in the map that the constructor got
    uint32_t mask = 0;
    size_t root_size = 0;  ///< the watched folder is the path cut to that length
  };

  WatchRules() = default;
  explicit WatchRules(const std::map<std::string, std::vector<QueueWatch>>& queues);

  /// One match for each queue that has the path at or below a watched folder and does not ignore it there, in the order
  /// of the queues. Of several watched folders of a queue the one nearest to the path decides: its mask counts, and its
  /// names to ignore. The result is valid until the next call.
  const std::vector<Match>& MatchesOf(std::string_view path) { return Collect(path, matches_); }
  /// The same with a result of its own, for the old path of a rename.
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

  base::PathTable<std::vector<Rule>> rules_;            ///< by the watched folder; "" stands for "/"
  std::map<std::string, std::vector<size_t>> by_path_;  ///< the queues of each watched folder, for VisitBelow
  std::vector<uint64_t> seen_;  ///< by queue: the last look-up that found a rule of it, so that only the nearest counts
  uint64_t lookup_ = 0;         ///< number of the look-up under way
  std::vector<Match> matches_;
  std::vector<Match> old_matches_;
};

}  // namespace ferrox::notifyd
