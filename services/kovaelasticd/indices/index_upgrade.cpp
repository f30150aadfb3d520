#include "services/kovaelasticd/indices/index_upgrade.h"

#include <syslog.h>

#include "base/priority.h"
#include "common/log.h"
#include "services/kovaelasticd/search/sqlite_search.h"
#include "services/kovaelasticd/store/sqlite_db.h"
#include "services/kovaelasticd/store/sqlite_store.h"
#include "services/kovaelasticd/store/store_format.h"
#include "services/kovaelasticd/store/store_stat.h"

namespace ferrox::engine {

namespace {

/// Ends an upgrade at the end of a turn.
struct UpgradeStopped {};

}  // namespace

std::string DescribeUpgrade(const UpgradeProgress& progress) {
  if (!progress.problem.empty()) return progress.problem;
  const int64_t percent = progress.of == 0 ? 0 : progress.done * 100 / progress.of;
  return "the index is being upgraded, " + std::to_string(percent) + " %";
}

IndexUpgrade::IndexUpgrade(std::string path, std::shared_ptr<const Schema> schema, UpgradeOptions options,
                           std::chrono::milliseconds retry_after)
    : path_(std::move(path)), schema_(std::move(schema)), options_(std::move(options)), retry_after_(retry_after) {
  readers_.emplace(path_);
  options_.on_turn = [this, on_turn = options_.on_turn](int64_t done, int64_t of) {
    on_turn(done, of);
    Note(done, of, "");
    const base::MutexLock lock(mutex_);
    if (stopping_) throw UpgradeStopped();
  };
}

IndexUpgrade::~IndexUpgrade() { Stop(); }

void IndexUpgrade::Start(std::function<void()> on_written, std::function<void()> on_damage) {
  on_written_ = std::move(on_written);
  on_damage_ = std::move(on_damage);
  thread_ = std::thread(&IndexUpgrade::ThreadMain, this);
}

void IndexUpgrade::Stop() {
  {
    const base::MutexLock lock(mutex_);
    stopping_ = true;
    wake_.NotifyAll();
  }
  if (thread_.joinable()) thread_.join();
}

void IndexUpgrade::ThreadMain() {
  (void)base::YieldToOthers();
  while (!Try()) {
    const auto again = std::chrono::steady_clock::now() + retry_after_;
    const base::MutexLock lock(mutex_);
    while (!stopping_ && wake_.WaitUntil(mutex_, again)) {
    }
    if (stopping_) return;
  }
}

/// A file that is in its place but could not be opened needs no second upgrade.
bool IndexUpgrade::Try() {
  try {
    if (!written_ && NeedsUpgrade(path_)) {
      Log(LOG_NOTICE, "index file %s: it has an older format, and is brought to format %d", path_.c_str(),
          static_cast<int>(kStoreFormat));
      WriteUpgraded(path_, schema_, options_);
      written_ = true;
    }
    on_written_();
    return true;
  } catch (const UpgradeStopped&) {
    return true;
  } catch (const IndexDamaged&) {
    on_damage_();
    return true;
  } catch (const std::exception& error) {
    Note(0, Progress().of, error.what());
    return false;
  }
}

void IndexUpgrade::Note(int64_t done, int64_t of, const std::string& problem) {
  const base::MutexLock lock(mutex_);
  progress_ = {done, of, problem};
}

UpgradeProgress IndexUpgrade::Progress() const {
  const base::MutexLock lock(mutex_);
  return progress_;
}

/// The readers' connections are closed first: the last one to go takes the log of the file by its name.
std::unique_ptr<IndexStore> IndexUpgrade::Finish() {
  readers_.emplace(path_);
  if (written_) ReplaceByUpgraded(path_);
  written_ = false;
  return std::make_unique<SqliteStore>(path_, false, schema_);
}

SearchReply IndexUpgrade::Search(const SearchRequest& request) {
  // The old file need not know who may read what.
  FERROX_FAIL_IF(request.asker != nullptr, Error::kEngineIndexPreparing, DescribeUpgrade(Progress()));
  return SearchIn(*readers_, request);
}

StoreStat IndexUpgrade::Stat() { return ReadStat(*readers_); }

}  // namespace ferrox::engine
