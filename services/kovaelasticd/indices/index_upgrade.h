#pragma once

#include <chrono>
#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <thread>

#include "base/mutex.h"
#include "services/kovaelasticd/store/index_store.h"
#include "services/kovaelasticd/store/store_reader.h"
#include "services/kovaelasticd/store/upgrade.h"
#include "services/kovaelasticd/text/schema.h"

namespace ferrox::engine {

/// How far the upgrade of an index is, in documents.
struct UpgradeProgress {
  int64_t done = 0;
  int64_t of = 0;
  std::string problem;  ///< why it waits, and what helps; "" while it goes on
};
/// "the index is being upgraded, 62 %", or what it waits for.
std::string DescribeUpgrade(const UpgradeProgress& progress);

/// An index whose file has an older format: what is found in the old file, and the thread of low priority that writes
/// the new one (upgrade.h). What cannot be done, for want of space above all, is tried again after kRetryAfter.
class IndexUpgrade {
 public:
  static constexpr std::chrono::seconds kRetryAfter{3600};

  /// `path` is the index file. Begins with Start.
  IndexUpgrade(std::string path, std::shared_ptr<const Schema> schema, UpgradeOptions options = {},
               std::chrono::milliseconds retry_after = kRetryAfter);
  IndexUpgrade(const IndexUpgrade&) = delete;
  IndexUpgrade& operator=(const IndexUpgrade&) = delete;
  /// Stops.
  ~IndexUpgrade();

  /// `on_written` and `on_damage` are called by the thread: once the new file is complete, to call Finish where nobody
  /// searches, and when a file turns out to be damaged. What the former throws is a reason to try again.
  void Start(std::function<void()> on_written, std::function<void()> on_damage);
  /// Ends the thread, after the turn that it is in. An unfinished file is removed.
  void Stop();
  /// Puts the new file into the old one's place, and opens it. @throws Error kEngineStorage, IndexDamaged; the old file
  /// can still be searched then.
  std::unique_ptr<IndexStore> Finish();

  /// In the old file, on the caller's thread. Any thread may call these three.
  SearchReply Search(const SearchRequest& request);
  StoreStat Stat();
  UpgradeProgress Progress() const;

 private:
  void ThreadMain();
  /// Whether the upgrade has ended, so that nothing is to be tried again.
  bool Try();
  void Note(int64_t done, int64_t of, const std::string& problem);

  const std::string path_;
  const std::shared_ptr<const Schema> schema_;
  UpgradeOptions options_;
  const std::chrono::milliseconds retry_after_;
  std::optional<ReaderPool> readers_;  ///< of the old file
  bool written_ = false;               ///< the new file is complete, and not in its place yet
  std::function<void()> on_written_;
  std::function<void()> on_damage_;

  mutable base::Mutex mutex_;
  base::ConditionVariable wake_;
  bool stopping_ BASE_GUARDED_BY(mutex_) = false;
  UpgradeProgress progress_ BASE_GUARDED_BY(mutex_);

  std::thread thread_;
};

}  // namespace ferrox::engine
