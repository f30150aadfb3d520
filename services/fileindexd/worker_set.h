#pragma once

#include <functional>
#include <map>
#include <memory>
#include <mutex>
#include <string>
#include <utility>
#include <vector>

#include <json/value.h>

#include "services/fileindexd/share_worker.h"

namespace ferrox::indexd {

/// The workers of all shares. A share has one when a folder names it, it exists, and not all of its folders are paused,
/// or as the last command for it says while the folders file does not say so yet (docs/formats/daemon.md has the orders
/// in which the management operations do things). Every call is safe from any thread; calls are carried out one after
/// the other.
class WorkerSet {
 public:
  using MakeWorker = std::function<std::unique_ptr<ShareWorker>(const std::string& share)>;

  /// `make` is called with the name of a share that exists; the set starts what it returns.
  explicit WorkerSet(MakeWorker make) : make_(std::move(make)) {}
  WorkerSet(const WorkerSet&) = delete;
  WorkerSet& operator=(const WorkerSet&) = delete;
  /// Stops all workers, at the same time.
  ~WorkerSet();

  /// Makes and ends workers so that they are those of the present folders and shares. One whose share lies elsewhere
  /// now is made anew. @throws Error when the folders or shares cannot be told; nothing is changed then.
  void Reconcile();

  /// The share gets a worker, a new one in place of one it has, whatever its folders' pause says. Nothing happens for a
  /// share that no folder names. @throws as Reconcile, and as Delete.
  void Create(const std::string& share);
  /// Ends the share's worker; it stays away until Create, SettingChanged, or until its folders were paused and resumed.
  /// @throws Error kInternal when it does not end in time; it is to end all the same.
  void Delete(const std::string& share);
  /// Forgets what was commanded for the share, and has its worker look at the folders again. @throws as Reconcile.
  void SettingChanged(const std::string& share);

  void WakeAll();
  /// Has the workers of these shares look at what has become of their index.
  void LookAtIndices(const std::vector<std::string>& shares) const;
  /// Waits until all that is queued now for the shares (none named: for all that have a worker) is in the index, at
  /// most until `end`. @return "", or a sentence for each share for which that cannot be said.
  std::string Sync(const std::vector<std::string>& shares, QueueProgress::TimePoint end) const;
  /// Ends all waiting in Sync, because the daemon stops.
  void EndSyncs(const std::string& reason) const;
  /// One object a worker, in the order of the shares' names.
  Json::Value Status() const;
  /// How many files have been read for their content, also by workers that are gone.
  uint64_t FilesRead() const;

 private:
  enum class Command { kCreate, kDelete };
  struct IndexedShare {
    std::string root;
    bool all_paused = true;
  };
  using Workers = std::map<std::string, std::shared_ptr<ShareWorker>>;
  static std::map<std::string, IndexedShare> IndexedShares();

  /// The present ones, for what takes longer than others can wait for.
  Workers Present() const;
  std::shared_ptr<ShareWorker> Find(const std::string& share) const;
  void ReconcileInOrder();
  void End(const std::string& share);
  bool Wants(const std::string& share, const IndexedShare& indexed);

  MakeWorker make_;
  std::mutex order_mutex_;  ///< held while workers are made and ended; taken before the other
  std::map<std::string, Command> commanded_;
  mutable std::mutex mutex_;    ///< of all below; held for moments, so that a worker that hangs makes nobody mute
  uint64_t read_by_ended_ = 0;  ///< files
  Workers workers_;             ///< shared with those who ask for its status
};

}  // namespace ferrox::indexd
