#pragma once

#include <functional>
#include <map>
#include <memory>
#include <string>
#include <utility>
#include <vector>

#include <json/value.h>

#include "base/mutex.h"
#include "services/fileindexd/indexed_shares.h"
#include "services/fileindexd/share_worker.h"

namespace ferrox::indexd {

/// The workers of all shares. A share has one when a folder names it, it exists, and not all of its folders are paused;
/// or as the last command for it says, until the folders file says the same (docs/formats/daemon.md has the orders in
/// which the management operations do things). Every call is safe from any thread; calls that make and end workers are
/// carried out one after the other, the rest beside them.
class WorkerSet {
 public:
  using MakeWorker = std::function<std::unique_ptr<ShareWorker>(const std::string& share)>;

  /// `make` is called with the name of a share that exists; the set starts what it returns.
  explicit WorkerSet(MakeWorker make) : make_(std::move(make)) {}
  WorkerSet(const WorkerSet&) = delete;
  WorkerSet& operator=(const WorkerSet&) = delete;
  /// Stops all workers, at the same time.
  ~WorkerSet();

  /// Makes and ends workers so that they are those of the present folders and shares. A worker whose share lies
  /// elsewhere now is replaced. @throws Error when folders or shares cannot be read; nothing is changed then.
  void Reconcile();

  /// The share gets a worker, a new one in place of one it has, whatever its folders' pause says. Nothing happens for a
  /// share that no folder names. @throws as Reconcile, and as Delete.
  void Create(const std::string& share);
  /// Ends the share's worker; it stays away until Create, SettingChanged, or until its folders were paused and resumed.
  /// Blocks up to 10 s. @throws Error kInternal when the worker has not ended by then; it still will.
  void Delete(const std::string& share);
  /// Drops the last command for the share, and has its worker check folders and index again. @throws as Reconcile.
  void SettingChanged(const std::string& share);

  void WakeAll();
  /// Has the workers of these shares check whether the engine has made their index anew.
  void CheckIndices(const std::vector<std::string>& shares) const;
  /// Blocks until all that is queued now for the shares (none named: for all that have a worker) is in the index, at
  /// most until `end`. @return "", or a sentence for each share of which that cannot be said.
  std::string Sync(const std::vector<std::string>& shares, QueueProgress::TimePoint end) const;
  /// Ends all waiting in Sync, because the daemon stops.
  void EndSyncs(const std::string& reason) const;
  /// One object for each worker, in the order of the shares' names. Blocks up to 2 s when the engine hangs.
  Json::Value Status() const;
  /// How many files have been read for their content, also by workers that have ended.
  uint64_t FilesRead() const;

 private:
  enum class Command { kCreateIndex, kDeleteIndex };
  using Workers = std::map<std::string, std::shared_ptr<ShareWorker>>;

  Workers Present() const;
  std::shared_ptr<ShareWorker> Find(const std::string& share) const;
  void ReconcileInOrder() BASE_REQUIRES(order_mutex_);
  void EndUnwanted(const IndexedShares& indexed_shares) BASE_REQUIRES(order_mutex_);
  void MakeMissing(const IndexedShares& indexed_shares) BASE_REQUIRES(order_mutex_);
  void End(const std::string& share) BASE_REQUIRES(order_mutex_);
  bool ShouldRun(const std::string& share, const IndexedShare& indexed) BASE_REQUIRES(order_mutex_);

  MakeWorker make_;
  /// Held while workers are made and ended, which may take seconds. Taken before the other mutex.
  base::Mutex order_mutex_;
  std::map<std::string, Command> commands_ BASE_GUARDED_BY(order_mutex_);  ///< the last one for a share
  /// Held for moments only, so that a worker that hangs holds up no status and no command for other shares.
  mutable base::Mutex mutex_;
  uint64_t read_by_ended_ BASE_GUARDED_BY(mutex_) = 0;  ///< files that ended workers have read
  Workers workers_ BASE_GUARDED_BY(mutex_);  ///< shared with request threads, so that one may outlive its End
};

}  // namespace ferrox::indexd
