#include "services/fileindexd/worker_set.h"

#include <syslog.h>

#include <algorithm>
#include <chrono>

#include "common/error.h"
#include "common/log.h"

namespace ferrox::indexd {

namespace {

/// A worker ends within this time, its waits for other daemons cut, unless a file system hangs.
constexpr std::chrono::seconds kEndPatience(10);

}  // namespace

WorkerSet::~WorkerSet() {
  for (const auto& [share, worker] : workers_) worker->RequestStop();
}

void WorkerSet::Reconcile() {
  const base::MutexLock order(order_mutex_);
  ReconcileInOrder();
}

void WorkerSet::Create(const std::string& share) {
  const base::MutexLock order(order_mutex_);
  commands_[share] = Command::kCreateIndex;
  End(share);
  ReconcileInOrder();
}

void WorkerSet::Delete(const std::string& share) {
  const base::MutexLock order(order_mutex_);
  commands_[share] = Command::kDeleteIndex;
  End(share);
}

void WorkerSet::SettingChanged(const std::string& share) {
  const base::MutexLock order(order_mutex_);
  commands_.erase(share);
  ReconcileInOrder();
  if (const auto worker = Find(share)) worker->CheckIndex();
}

void WorkerSet::ReconcileInOrder() {
  const IndexedShares indexed_shares = LoadIndexedShares();
  std::erase_if(commands_, [&](const auto& item) { return indexed_shares.count(item.first) == 0; });
  EndUnwanted(indexed_shares);
  MakeMissing(indexed_shares);
  for (const auto& [share, worker] : Present()) worker->SetInnerShares(InnerRoots(indexed_shares, worker->Root()));
}

void WorkerSet::EndUnwanted(const IndexedShares& indexed_shares) {
  for (const auto& [share, worker] : Present()) {
    const auto indexed = indexed_shares.find(share);
    const bool usable = indexed != indexed_shares.end() && indexed->second.root == worker->Root();
    if (usable && ShouldRun(share, indexed->second) && !worker->IsStopping()) continue;
    try {
      End(share);
      if (!usable) worker->Forget();
    } catch (const Error&) {
      // Logged; the next reconciliation tries again.
    }
  }
}

void WorkerSet::MakeMissing(const IndexedShares& indexed_shares) {
  const Workers present = Present();
  for (const auto& [share, indexed] : indexed_shares) {
    if (present.count(share) != 0 || !ShouldRun(share, indexed)) continue;
    try {
      std::shared_ptr<ShareWorker> made = make_(share);
      made->Start();
      const base::MutexLock lock(mutex_);
      workers_[share] = std::move(made);
    } catch (const Error& error) {
      Log(LOG_ERR, "share %s gets no worker for now: %s", share.c_str(), error.what());
    }
  }
}

/// A command holds until the folders say the same.
bool WorkerSet::ShouldRun(const std::string& share, const IndexedShare& indexed) {
  const auto command = commands_.find(share);
  if (command == commands_.end()) return !indexed.all_paused;
  const bool wanted = command->second == Command::kCreateIndex;
  if (wanted == !indexed.all_paused) commands_.erase(command);
  return wanted;
}

/// A worker that hangs stays in the set, since no other may work on its queue, and is waited for only once.
void WorkerSet::End(const std::string& share) {
  const auto worker = Find(share);
  if (worker == nullptr) return;
  const bool ended = worker->StopWithin(worker->IsStopping() ? std::chrono::seconds(0) : kEndPatience);
  FERROX_FAIL_IF(!ended, Error::kInternal,
                 "the worker of share " + share + " does not end: its file system may hang; look at " + worker->Root());
  const base::MutexLock lock(mutex_);
  read_by_ended_ += worker->FilesRead();
  workers_.erase(share);
}

void WorkerSet::WakeAll() {
  for (const auto& [share, worker] : Present()) worker->Wake();
}

void WorkerSet::CheckIndices(const std::vector<std::string>& shares) const {
  for (const std::string& share : shares) {
    if (const auto worker = Find(share)) worker->CheckIndex();
  }
}

/// A copy, for what takes longer than the mutex may be held.
WorkerSet::Workers WorkerSet::Present() const {
  const base::MutexLock lock(mutex_);
  return workers_;
}

std::shared_ptr<ShareWorker> WorkerSet::Find(const std::string& share) const {
  const base::MutexLock lock(mutex_);
  const auto found = workers_.find(share);
  return found != workers_.end() ? found->second : nullptr;
}

/// All requests are made before the first is waited for, so that the shares are worked on beside each other.
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

/// Each worker asks the engine. All share one deadline, so that an engine that hangs costs the wait once, however many
/// shares there are.
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
  const base::MutexLock lock(mutex_);
  uint64_t files = read_by_ended_;
  for (const auto& [share, worker] : workers_) files += worker->FilesRead();
  return files;
}

}  // namespace ferrox::indexd
