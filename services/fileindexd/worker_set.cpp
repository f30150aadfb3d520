#include "services/fileindexd/worker_set.h"

#include <syslog.h>

#include <algorithm>
#include <iterator>
#include <set>
#include <vector>

#include "common/error.h"
#include "common/log.h"
#include "fileindex/folder_mgr.h"
#include "sdk/share.h"

namespace ferrox::indexd {

void WorkerSet::Reconcile() {
  const std::lock_guard lock(mutex_);
  ReconcileLocked();
}

void WorkerSet::Create(const std::string& share) {
  const std::lock_guard lock(mutex_);
  workers_.erase(share);
  commanded_[share] = Command::kCreate;
  ReconcileLocked();
}

void WorkerSet::Delete(const std::string& share) {
  const std::lock_guard lock(mutex_);
  commanded_[share] = Command::kDelete;
  workers_.erase(share);
}

void WorkerSet::SettingChanged(const std::string& share) {
  const std::lock_guard lock(mutex_);
  commanded_.erase(share);
  ReconcileLocked();
  const auto worker = workers_.find(share);
  if (worker != workers_.end()) worker->second->Wake();
}

void WorkerSet::WakeAll() {
  const std::lock_guard lock(mutex_);
  for (const auto& [share, worker] : workers_) worker->Wake();
}

Json::Value WorkerSet::Status() const {
  Json::Value shares(Json::arrayValue);
  const std::lock_guard lock(mutex_);
  for (const auto& [share, worker] : workers_) shares.append(worker->Status());
  return shares;
}

std::map<std::string, WorkerSet::IndexedShare> WorkerSet::IndexedShares() {
  const fileindex::FolderMgr folder_mgr;
  // All at once: a share table that cannot be read must not look like one without shares.
  const std::vector<std::string> names = sdk::SDKShare::Enum();
  const std::set<std::string> existing(names.begin(), names.end());
  std::map<std::string, IndexedShare> shares;
  for (const auto& folder : folder_mgr.GetFolders()) {
    if (folder->GetPath().empty() || folder->GetPath().front() != '/') continue;
    const std::string share = folder->GetShare();
    if (existing.count(share) == 0) continue;
    IndexedShare& indexed = shares[share];
    indexed.all_paused = indexed.all_paused && folder->IsPaused();
  }
  for (auto& [share, indexed] : shares) indexed.root = sdk::SDKShare(share).GetPath();
  return shares;
}

void WorkerSet::ReconcileLocked() {
  const std::map<std::string, IndexedShare> indexed_shares = IndexedShares();
  const auto is_gone = [&indexed_shares](const auto& item) { return indexed_shares.count(item.first) == 0; };
  std::erase_if(commanded_, is_gone);
  std::erase_if(workers_, is_gone);
  for (const auto& [share, indexed] : indexed_shares) {
    const auto worker = workers_.find(share);
    const bool usable = worker != workers_.end() && worker->second->Root() == indexed.root;
    const bool wanted = Wants(share, indexed);
    if (worker != workers_.end() && !(wanted && usable)) workers_.erase(worker);
    if (!wanted || usable) continue;
    try {
      auto made = make_(share);
      made->Start();
      workers_[share] = std::move(made);
    } catch (const Error& error) {
      Log(LOG_ERR, "share %s gets no worker for now: %s", share.c_str(), error.what());
    }
  }
}

/// A command holds until the folders say the same.
bool WorkerSet::Wants(const std::string& share, const IndexedShare& indexed) {
  const auto command = commanded_.find(share);
  if (command == commanded_.end()) return !indexed.all_paused;
  const bool wanted = command->second == Command::kCreate;
  if (wanted == !indexed.all_paused) commanded_.erase(command);
  return wanted;
}

}  // namespace ferrox::indexd
