#pragma once

#include <atomic>
#include <chrono>
#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "services/kovaelasticd/store/folder_tree.h"
#include "services/kovaelasticd/store/index_store.h"
#include "services/kovaelasticd/store/row_watch.h"
#include "services/kovaelasticd/store/sqlite_db.h"

namespace ferrox::engine {

/// The documents that a condition on their rows lists (suspects, unread, those of a file), in the order of their paths,
/// in pages. Paths are composed, so this order stands nowhere: it is made for the first page and kept for those that
/// follow, kKeptMaxBytes of it at most. What changes between two pages is looked at again, so that each page is what it
/// would be had it been made anew. For the thread that writes; members throw Error kEngineStorage.
class ListedDocuments {
 public:
  using SteadyClock = std::chrono::steady_clock;

  /// Both must outlive this.
  ListedDocuments(Database& database, FolderTree& tree) : database_(database), tree_(tree) {}

  /// The numbers of the page's documents, in their order.
  std::vector<int64_t> Page(const GetRequest& request);
  /// To be called with each row that changes.
  void OnRow(RowWatch::Table table, int64_t number, bool is_update);
  /// Drops what is kept, as after a rollback.
  void Forget();
  /// When the last page was asked for; nothing while nothing is kept. For any thread.
  std::optional<SteadyClock::time_point> Used() const {
    const SteadyClock::time_point used = used_;
    return used == SteadyClock::time_point() ? std::nullopt : std::optional(used);
  }

 private:
  static constexpr size_t kKeptMaxBytes = 8 << 20;
  static constexpr size_t kChangedMax = 10000;
  enum class List { kNone, kSuspects, kUnread, kFile };
  struct Entry {
    std::string path;
    int64_t id;
    bool operator>(const Entry& other) const { return path > other.path; }
  };

  Statement Select(int64_t id);
  std::string PathIn(const Statement& row);
  void Gather(const std::string& after);
  void Shorten();
  void TakeChangesIn(const std::string& after);

  Database& database_;
  FolderTree& tree_;
  std::atomic<SteadyClock::time_point> used_{};
  List list_ = List::kNone;       ///< that of kept_; kNone: nothing is kept
  int64_t file_ = 0;              ///< of kFile
  std::string after_;             ///< kept_ has what is behind this path,
  std::string end_;               ///< up to this one; "": up to the last
  std::vector<Entry> kept_;       ///< the last first
  std::vector<int64_t> changed_;  ///< documents that were changed since
};

}  // namespace ferrox::engine
