#include "services/fileindexd/worker_set.h"

#include <syslog.h>

#include <algorithm>
#include <chrono>
#include <set>

#include "common/error.h"
#include "common/file_util.h"
#include "common/log.h"
#include "fileindex/folders/folder_mgr.h"
#include "sdk/share.h"

namespace ferrox::indexd {

namespace {

/// What a worker does besides asking other daemons takes no longer, unless a file system hangs.
constexpr std::chrono::seconds kEndPatience(10);

}  // namespace

WorkerSet::~WorkerSet() {
  for (const auto& [share, worker] : workers_) worker->RequestStop();
}

void WorkerSet::Reconcile() {
  const std::lock_guard order(order_mutex_);
  ReconcileInOrder();
}

void WorkerSet::Create(const std::string& share) {
  const std::lock_guard order(order_mutex_);
  commanded_[share] = Command::kCreate;
  End(share);
  ReconcileInOrder();
}

void WorkerSet::Delete(const std::string& share) {
  const std::lock_guard order(order_mutex_);
  commanded_[share] = Command::kDelete;
  End(share);
}

void WorkerSet::SettingChanged(const std::string& share) {
  const std::lock_guard order(order_mutex_);
  commanded_.erase(share);
  ReconcileInOrder();
  if (const auto worker = Find(share)) worker->LookAtIndex();
}

void WorkerSet::WakeAll() {
  for (const auto& [share, worker] : Present()) worker->Wake();
}

void WorkerSet::LookAtIndices(const std::vector<std::string>& shares) const {
  for (const std::string& share : shares) {
    if (const auto worker = Find(share)) worker->LookAtIndex();
  }
}

WorkerSet::Workers WorkerSet::Present() const {
  const std::lock_guard lock(mutex_);
  return workers_;
}

std::shared_ptr<ShareWorker> WorkerSet::Find(const std::string& share) const {
  const std::lock_guard lock(mutex_);
  const auto found = workers_.find(share);
  return found != workers_.end() ? found->second : nullptr;
}

/// All are asked before the first is waited for.
std::string WorkerSet::Sync(const std::vector<std::string>& shares, QueueProgress::TimePoint end) const {
  Workers workers = Present();
  std::string problems;
  for (const std::string& share : shares) {
    if (workers.count(share) != 0) continue;
    problems += (problems.empty() ? "share " : "; share ") + share +
                ": it is paused, or no folder of it is indexed; 'fileindexctl status' shows its state";
  }
  if (!shares.empty()) {
    std::erase_if(workers, [&shares](const auto& item) {
      return std::find(shares.begin(), shares.end(), item.first) == shares.end();
    });
  }
  std::map<std::string, uint64_t> requests;
  for (const auto& [share, worker] : workers) requests[share] = worker->RequestSync();
  for (const auto& [share, request] : requests) {
    const std::string problem = workers[share]->AwaitSync(request, end);
    if (!problem.empty()) problems += (problems.empty() ? "" : "; ") + problem;
  }
  return problems;
}

void WorkerSet::EndSyncs(const std::string& reason) const {
  for (const auto& [share, worker] : Present()) worker->EndSyncs(reason);
}

/// The engine, which is asked for each worker, may be slow; commands do not wait for it. One that hangs costs the wait
/// once, however many shares there are.
Json::Value WorkerSet::Status() const {
  using std::chrono::milliseconds;
  const auto end = std::chrono::steady_clock::now() + ShareWorker::kEngineWait;
  Json::Value shares(Json::arrayValue);
  for (const auto& [share, worker] : Present()) {
    const auto left = std::chrono::duration_cast<milliseconds>(end - std::chrono::steady_clock::now());
    shares.append(worker->Status(std::max(left, milliseconds(0))));
  }
  return shares;
}

uint64_t WorkerSet::FilesRead() const {
  const std::lock_guard lock(mutex_);
  uint64_t files = read_by_ended_;
  for (const auto& [share, worker] : workers_) files += worker->FilesRead();
  return files;
}

/// Somebody may be asking the worker for its status, so that it is not gone when it is out of the set. One that hangs
/// stays in it: no other may work on its queue. It is waited for once only.
void WorkerSet::End(const std::string& share) {
  const auto worker = Find(share);
  if (worker == nullptr) return;
  const bool ended = worker->StopWithin(worker->IsStopping() ? std::chrono::seconds(0) : kEndPatience);
  FERROX_FAIL_IF(!ended, Error::kInternal,
                 "the worker of share " + share + " does not end: its file system may hang; look at " + worker->Root());
  const std::lock_guard lock(mutex_);
  read_by_ended_ += worker->FilesRead();
  workers_.erase(share);
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

void WorkerSet::ReconcileInOrder() {
  const std::map<std::string, IndexedShare> indexed_shares = IndexedShares();
  std::erase_if(commanded_, [&](const auto& item) { return indexed_shares.count(item.first) == 0; });
  for (const auto& [share, worker] : Present()) {
    const auto indexed = indexed_shares.find(share);
    const bool usable = indexed != indexed_shares.end() && indexed->second.root == worker->Root();
    if (usable && Wants(share, indexed->second) && !worker->IsStopping()) continue;
    try {
      End(share);
      if (!usable) worker->Forget();
    } catch (const Error&) {
      // Logged; looked at again with the next change, or after a while.
    }
  }
  const Workers present = Present();
  for (const auto& [share, indexed] : indexed_shares) {
    if (present.count(share) != 0 || !Wants(share, indexed)) continue;
    try {
      std::shared_ptr<ShareWorker> made = make_(share);
      made->Start();
      const std::lock_guard lock(mutex_);
      workers_[share] = std::move(made);
    } catch (const Error& error) {
      Log(LOG_ERR, "share %s gets no worker for now: %s", share.c_str(), error.what());
    }
  }
  for (const auto& [share, worker] : Present()) {
    std::vector<std::string> inner;
    for (const auto& [name, other] : indexed_shares) {
      if (StringStartWith(other.root, worker->Root() + "/")) inner.push_back(other.root);
    }
    worker->NoteInner(inner);
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
